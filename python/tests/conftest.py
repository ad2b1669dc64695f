"""Fixtures of the faultbox module's tests: sample documents made with the
faultbox program, the root object on the built-in simulator (asked for, as
it never is by default), settings and benches in other processes for single
tests, and a clean component after every test."""

import os
import pathlib
import shutil
import subprocess
import tempfile

import pytest

import faultbox

SOURCE_DIR = pathlib.Path(os.environ.get("FAULTBOX_SOURCE_DIR", pathlib.Path(__file__).resolve().parents[2]))
BUILD_DIR = pathlib.Path(os.environ.get("FAULTBOX_BUILD_DIR", pathlib.Path(faultbox.__file__).resolve().parents[2]))

# Without a settings file of their own the tests would read the user's.
# A short collection wait keeps the KR60 resets quick; the serial answer
# waits leave the simulator's thread time on a busy machine.
_SETTINGS_DIR = tempfile.mkdtemp(prefix="faultbox-pytest-")
SETTINGS = pathlib.Path(_SETTINGS_DIR) / "faultbox.ini"

def timeouts(collection_wait=300):
    return (
        "[Components\\Faultbox.Component]\nTimeout=2500\n"
        f"[Components\\Faultbox.Component\\Hardware]\nResetCollectionWait={collection_wait}\n"
    )


SETTINGS.write_text(timeouts())
os.environ["FAULTBOX_CONFIG"] = str(SETTINGS)
os.environ.setdefault("NORVIK_ROOT", str(BUILD_DIR / "data" / "norvik"))
# Scripts started by the tests choose the simulator themselves, or through this.
os.environ.pop("FAULTBOX_HARDWARE", None)
FAULTBOX_CLI = os.environ.get("FAULTBOX_CLI", str(BUILD_DIR / "apps" / "faultbox" / "faultbox"))
FAULTBOX_SIM = str(BUILD_DIR / "apps" / "faultbox-sim" / "faultbox-sim")
FAULTBOX_CANHUB = str(BUILD_DIR / "apps" / "faultbox-canhub" / "faultbox-canhub")

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
    for system in root.Systems:
        with system:  # deactivates, disconnects and closes
            pass


@pytest.fixture
def settings_with():
    """settings_with(tables, collection_wait=300): the settings' tables (and the
    KR60 reset's collection wait) for this test only."""
    yield lambda tables, collection_wait=300: SETTINGS.write_text(timeouts(collection_wait) + tables)
    SETTINGS.write_text(timeouts())


@pytest.fixture
def hub_bench(tmp_path):
    """hub_bench(pin_file, *options): a KR60 bench in a faultbox-sim process
    on a bus of its own hub; answers the bus's target "tcp:HOST:PORT/BUS"."""
    processes = []

    def start(pin_file, *options):
        hub = subprocess.Popen([FAULTBOX_CANHUB, "--port", "0"], stdout=subprocess.PIPE, text=True)
        processes.append(hub)
        bus = f"127.0.0.1:{hub.stdout.readline().strip()}/script"
        bench = subprocess.Popen(
            [FAULTBOX_SIM, "kr60", "--pin-file", str(pin_file), "--hub", bus, *options],
            stdout=subprocess.PIPE, text=True,
        )
        processes.append(bench)
        target = bench.stdout.readline().strip()
        assert target == "tcp:" + bus
        return target

    yield start
    for process in reversed(processes):
        process.terminate()
        process.wait(timeout=60)


def expect_failure(code, call, *args, **kwargs):
    """Runs call(*args, **kwargs), which must raise FaultboxError with `code`;
    answers the error."""
    with pytest.raises(faultbox.FaultboxError) as caught:
        call(*args, **kwargs)
    assert caught.value.hresult == code, caught.value
    return caught.value
