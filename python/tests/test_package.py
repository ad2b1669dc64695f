"""The package as it is shipped: its types checked by mypy --strict on the
examples and against the module, the pytest plugin on a suite that leaves a pattern activated and on
the example suite, and the installation into a prefix."""

import os
import re
import subprocess
import sys
import textwrap

import pytest

import faultbox
from conftest import BUILD_DIR, SOURCE_DIR

PACKAGE_DIR = os.path.dirname(faultbox.__file__)
EXAMPLES = SOURCE_DIR / "python" / "examples"


def run(command, **kwargs):
    return subprocess.run(command, capture_output=True, text=True, check=False, timeout=240, **kwargs)


def test_mypy_strict_passes_on_the_examples_and_a_typed_test(tmp_path):
    checked = [EXAMPLES / "bench_example.py", EXAMPLES / "bench_suite", PACKAGE_DIR,
               SOURCE_DIR / "python" / "tests" / "test_idioms.py"]
    environment = dict(os.environ, MYPYPATH=os.path.dirname(PACKAGE_DIR))
    result = run([sys.executable, "-m", "mypy", "--strict", "--cache-dir", str(tmp_path), *map(str, checked)],
                 env=environment)
    assert result.returncode == 0, result.stdout + result.stderr
    # The stubs declare what the module has. pybind11's classes have a
    # metaclass and constructor of their own, which stubs do not spell.
    classes = [name for name, value in vars(faultbox).items()
               if isinstance(value, type) and value.__module__ == "faultbox" and not issubclass(value, (BaseException, int))]
    allowlist = tmp_path / "allowlist"
    allowlist.write_text("".join("faultbox._faultbox.%s(.__init__)?\n" % name for name in classes))
    result = run([sys.executable, "-m", "mypy.stubtest", "faultbox._faultbox", "--allowlist", str(allowlist),
                  "--mypy-config-file", os.devnull], env=environment)
    assert result.returncode == 0, result.stdout + result.stderr


PLUGIN_SUITE = '''
import pytest
import faultbox

@pytest.fixture
def pattern(faultbox_system):
    pattern = faultbox_system.FailurePatterns.Add()
    pattern.Pins.Add(("ECM", "A12")).SetFailureClass(1)
    return pattern

@pytest.fixture
def left_on(faultbox_system, pattern):
    pattern.Activate()

def test_leaves_it_activated(pattern):
    pattern.Activate()

def test_the_bench_is_off_again(faultbox_system):
    assert faultbox_system.FailurePatterns.ActivatedFailurePattern is None
    assert faultbox.sim_relays(faultbox_system) == ["all relays off"]

def test_with_a_fixture_that_leaves_it_activated(left_on):
    pass

test_off_after_the_fixture = test_the_bench_is_off_again

@pytest.mark.faultbox_document("missing.fsa")
def test_marked_with_another_document(faultbox_document):
    assert faultbox_document == __file__.rsplit("/", 1)[0] + "/missing.fsa"
'''


def run_pytest(folder, *arguments):
    environment = dict(os.environ, PYTHONPATH=os.path.dirname(PACKAGE_DIR))
    return run([sys.executable, "-m", "pytest", "-p", "no:cacheprovider", "-p", "faultbox.pytest_plugin",
                "--faultbox-sim", *map(str, arguments), str(folder)], env=environment, cwd=folder)


def test_the_plugin_fails_a_test_that_leaves_a_pattern_activated(make_document, tmp_path):
    (tmp_path / "test_suite.py").write_text(PLUGIN_SUITE)
    result = run_pytest(tmp_path, "--faultbox-document", make_document("KR60"), "-rfE")
    out = result.stdout
    assert result.returncode == 1, out + result.stderr
    assert "1 failed, 4 passed, 1 error" in out, out
    assert "FAILED test_suite.py::test_leaves_it_activated" in out
    assert "ERROR test_suite.py::test_with_a_fixture_that_leaves_it_activated" in out
    assert "faultbox: the test left pattern 'Failure pattern" in out
    assert "faultbox: the test's fixtures left pattern 'Failure pattern" in out


@pytest.mark.parametrize("platform", ["KR60", "KR40"])
def test_the_example_suite_passes_on_the_sample_benches(make_document, platform):
    result = run_pytest(EXAMPLES / "bench_suite", "--faultbox-document", make_document(platform), "-q")
    assert result.returncode == 0, result.stdout + result.stderr


def test_install_puts_the_package_where_python_finds_it(tmp_path):
    cache = (BUILD_DIR / "CMakeCache.txt").read_text()
    folder = re.search(r"^FAULTBOX_PYTHON_INSTALL_DIR:STRING=(.*)$", cache, re.M).group(1)
    result = run(["cmake", "--install", str(BUILD_DIR), "--component", "python", "--prefix", str(tmp_path)])
    assert result.returncode == 0, result.stdout + result.stderr
    installed = tmp_path / folder / "faultbox"
    shipped = {name for name in os.listdir(PACKAGE_DIR) if name != "__pycache__"}
    assert set(os.listdir(installed)) == shipped and "pytest_plugin.py" in shipped
    # Debian's interpreter looks in that folder below /usr/local without PYTHONPATH ...
    result = run(["/usr/bin/python3", "-c", "import site; print(site.getsitepackages())"])
    assert os.path.join("/usr/local", folder) in result.stdout
    # ... and the installed package is complete there.
    result = run([sys.executable, "-c", "import faultbox, faultbox.pytest_plugin; print(faultbox.__file__)"],
                 env=dict(os.environ, PYTHONPATH=str(tmp_path / folder)), cwd=tmp_path)
    assert result.stdout.strip() == str(installed / "__init__.py"), result.stderr
