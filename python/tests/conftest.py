"""Fixtures of the faultbox module's tests: sample documents made with the
faultbox program, the root object on the built-in simulator, and a clean
component after every test."""

import os
import pathlib
import shutil
import subprocess
import tempfile

import pytest

import faultbox

SOURCE_DIR = pathlib.Path(os.environ.get("FAULTBOX_SOURCE_DIR", pathlib.Path(__file__).resolve().parents[2]))
BUILD_DIR = pathlib.Path(faultbox.__file__).resolve().parents[1]

# Without a settings file of their own the tests would read the user's.
# A short collection wait keeps the KR60 resets quick; the serial answer
# waits leave the simulator's thread time on a busy machine.
_SETTINGS_DIR = tempfile.mkdtemp(prefix="faultbox-pytest-")
SETTINGS = pathlib.Path(_SETTINGS_DIR) / "faultbox.ini"
SETTINGS.write_text(
    "[Components\\Faultbox.Component]\nTimeout=2500\n"
    "[Components\\Faultbox.Component\\Hardware]\nResetCollectionWait=300\n"
)
os.environ["FAULTBOX_CONFIG"] = str(SETTINGS)
os.environ.setdefault("NORVIK_ROOT", str(BUILD_DIR / "data" / "norvik"))
FAULTBOX_CLI = os.environ.get("FAULTBOX_CLI", str(BUILD_DIR / "apps" / "faultbox" / "faultbox"))

# The sample benches: the files of data/ (pin file first) and the document's suffix.
BENCHES = {
    "KR60": (["kr60_bench.csv", "kr60_additional.csv"], ".fsa"),
    "KR40": (["kr40_bench.csv"], ".fss"),
}


def pytest_sessionfinish(session, exitstatus):
    shutil.rmtree(_SETTINGS_DIR, ignore_errors=True)


def run_cli(*args):
    result = subprocess.run([FAULTBOX_CLI, *map(str, args)], capture_output=True, text=True, check=False)
    assert result.returncode == 0, f"faultbox {' '.join(map(str, args))}\n{result.stdout}{result.stderr}"
    return result


@pytest.fixture
def make_document(tmp_path):
    """make_document(platform, name="bench"): a new document of the sample
    bench of `platform` ("KR40" or "KR60") in the test's folder."""

    def make(platform, name="bench"):
        files, suffix = BENCHES[platform]
        for file in files:
            if not (tmp_path / file).exists():
                shutil.copy(SOURCE_DIR / "data" / file, tmp_path / file)
        document = tmp_path / (name + suffix)
        run_cli("doc", "new", "--pin-file", tmp_path / files[0], document)
        return str(document)

    return make


@pytest.fixture(scope="session")
def root():
    root = faultbox.FaultInjection()
    root.SelectHardware("sim")
    return root


@pytest.fixture(autouse=True)
def clean_component(root):
    """Every test leaves no pattern activated, no system connected or open."""
    yield
    for system in list(root.Systems):
        active = system.FailurePatterns.ActivatedFailurePattern
        if active is not None:
            active.Deactivate()
        if system.IsConnected():
            system.Disconnect()
    root.Systems.CloseAll()


def expect_failure(code, call, *args, **kwargs):
    """Runs call(*args, **kwargs), which must raise FaultboxError with `code`;
    answers the error."""
    with pytest.raises(faultbox.FaultboxError) as caught:
        call(*args, **kwargs)
    assert caught.value.hresult == code, caught.value
    return caught.value
