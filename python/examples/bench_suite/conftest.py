"""The example bench suite's set-up: the faultbox plugin gives its fixtures.

    pytest python/examples/bench_suite --faultbox-document chassis.fsa [--faultbox-sim]
"""

pytest_plugins = ["faultbox.pytest_plugin"]
