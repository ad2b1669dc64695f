"""pytest fixtures for tests on a failure insertion bench.

Enable with ``pytest -p faultbox.pytest_plugin`` or, in the suite's top
``conftest.py``, ``pytest_plugins = ["faultbox.pytest_plugin"]``.

- ``--faultbox-document PATH`` names the bench's document (.fsa or .fss);
  ``@pytest.mark.faultbox_document(PATH)`` names another one for a test or a
  module (a relative path is taken from the test file's folder).
- ``--faultbox-sim`` runs the tests on the built-in simulated bench of the
  document's pin files; without it the configured hardware is used.
- ``faultbox_system`` is the document's System, connected. It is opened and
  connected once and kept for the tests that follow; the session closes it.
- After every test no pattern is left activated. One that the test left
  activated is deactivated (the hardware reset when that fails) and the test
  fails; one that its fixtures left gives an error at the test's teardown.
  So activate patterns in the test (``with pattern.activated():``) or in a
  function-scoped fixture that deactivates them again.
"""

from __future__ import annotations

import os
import warnings
from typing import Any, Dict, Generator, List

import pytest

import faultbox

_MARK = "faultbox_document"
_LEFT = pytest.StashKey[str]()
_AFTER_SETUP = pytest.StashKey[Dict[str, str]]()


def pytest_addoption(parser: pytest.Parser) -> None:
    group = parser.getgroup("faultbox", "failure insertion bench")
    group.addoption("--faultbox-document", metavar="PATH", help="the bench's document (.fsa or .fss)")
    group.addoption(
        "--faultbox-sim",
        action="store_true",
        help="run on the built-in simulated bench of the document's pin files, not the configured hardware",
    )


def pytest_configure(config: pytest.Config) -> None:
    config.addinivalue_line("markers", _MARK + "(path): the bench document the test's faultbox_system opens")


@pytest.fixture(scope="session")
def faultbox_root(pytestconfig: pytest.Config) -> faultbox._FaultInjection:
    """The root object, on the simulator with --faultbox-sim."""
    root = faultbox.FaultInjection()
    if pytestconfig.getoption("faultbox_sim"):
        root.SelectHardware("sim")
    return root


@pytest.fixture
def faultbox_document(request: pytest.FixtureRequest) -> str:
    """The absolute path of the test's bench document: the marker's, else
    --faultbox-document."""
    marker = request.node.get_closest_marker(_MARK)
    if marker is not None:
        path = os.path.join(os.path.dirname(request.node.path), str(marker.args[0]))
    else:
        option = request.config.getoption("faultbox_document")
        if not option:
            pytest.fail("no bench document: give --faultbox-document or mark the test with faultbox_document",
                        pytrace=False)
        path = os.path.join(request.config.invocation_params.dir, str(option))
    return os.path.abspath(path)


@pytest.fixture
def faultbox_system(faultbox_root: faultbox._FaultInjection, faultbox_document: str) -> faultbox.System:
    """The System of the test's document, connected to its hardware."""
    systems = faultbox_root.Systems
    system = systems[faultbox_document] if faultbox_document in systems else systems.Open(faultbox_document)
    if not system.IsConnected():
        system.Connect()
    return system


def _activated() -> Dict[str, str]:
    """The activated pattern of every open system, by system name."""
    if not faultbox._started():
        return {}
    found: Dict[str, str] = {}
    for system in faultbox.FaultInjection().Systems:
        pattern = system.FailurePatterns.ActivatedFailurePattern
        if pattern is not None:
            found[system.Name] = pattern.Name
    return found


def _switch_off(systems: List[str]) -> str:
    """Switches the named systems off; says what was left activated."""
    root = faultbox.FaultInjection()
    left = []
    for name in systems:
        try:
            pattern = faultbox.switch_off(root.Systems[name])
            left.append("pattern %r of %s" % (pattern, name))
        except faultbox.FaultboxError as error:
            left.append("a pattern of %s, which could not be switched off: %s" % (name, error))
    return ", ".join(left)


# The guard only watches and switches off inside the hooks below; what it
# found turns the phase's report into a failure, so that the other plugins'
# hooks run as usual. (pytest's hookimpl carries no types: hence the ignores.)


@pytest.hookimpl(hookwrapper=True)  # type: ignore[misc]
def pytest_runtest_setup(item: pytest.Item) -> Generator[None, Any, None]:
    yield
    item.stash[_AFTER_SETUP] = _activated()


@pytest.hookimpl(hookwrapper=True)  # type: ignore[misc]
def pytest_runtest_call(item: pytest.Item) -> Generator[None, Any, None]:
    yield
    # What was activated before the test is the fixtures' to end.
    before: Dict[str, str] = item.stash.get(_AFTER_SETUP, {})
    left = [name for name, pattern in _activated().items() if before.get(name) != pattern]
    if left:
        item.stash[_LEFT] = "the test left %s activated; it was deactivated after the test" % _switch_off(left)


@pytest.hookimpl(hookwrapper=True)  # type: ignore[misc]
def pytest_runtest_teardown(item: pytest.Item) -> Generator[None, Any, None]:
    yield
    left = list(_activated())
    if left:
        item.stash[_LEFT] = "the test's fixtures left %s activated; it was deactivated after the test" % _switch_off(
            left
        )


@pytest.hookimpl(hookwrapper=True)  # type: ignore[misc]
def pytest_runtest_makereport(item: pytest.Item, call: pytest.CallInfo[None]) -> Generator[None, Any, None]:
    outcome = yield
    message = item.stash.get(_LEFT, "")
    if not message or call.when == "setup":
        return
    del item.stash[_LEFT]
    report: pytest.TestReport = outcome.get_result()
    if report.passed:
        report.outcome = "failed"
        report.longrepr = "faultbox: " + message
    else:
        report.sections.append(("faultbox", message))


def pytest_sessionfinish(session: pytest.Session) -> None:
    if not faultbox._started():
        return
    for system in faultbox.FaultInjection().Systems:
        try:
            # Leaving the block deactivates, disconnects and closes the system.
            with system:
                pass
        except faultbox.FaultboxError as error:
            warnings.warn(pytest.PytestWarning("faultbox: closing %s: %s" % (system.Name, error)))
