"""Scripts on the built-in simulated benches: the guide's example on both
platforms, switching by pin lists, the messages in logging, calls from
several threads, and the orderly end at the interpreter's exit."""

import importlib.util
import logging
import os
import socket
import subprocess
import sys
import threading

import pytest

import faultbox
from conftest import SOURCE_DIR, expect_failure

ALL_OFF = ["all relays off"]


def load_example():
    path = SOURCE_DIR / "python" / "examples" / "bench_example.py"
    spec = importlib.util.spec_from_file_location("bench_example", path)
    example = importlib.util.module_from_spec(spec)
    spec.loader.exec_module(example)
    return example


@pytest.mark.parametrize(
    "platform, pin, ecu, class_id, relays",
    [
        # Class 1 opens the line: load relay 2 of the pin's load channel.
        ("KR60", "A12", "ECM", 1, ["LOAD 0x011: channel 1 relay 2 on"]),
        # The same class on a KR40 relay box: relay 0 of the pin's channel.
        ("KR40", "X1.1", "BCM", 1, ["FIU 0x10: relay 1 (state 1) on"]),
    ],
)
def test_the_guides_example(root, make_document, capsys, platform, pin, ecu, class_id, relays):
    document = make_document(platform)
    seen = load_example().run(document, ecu, pin, class_id, "sim")
    assert seen == {"activated": relays, "deactivated": ALL_OFF}
    out = capsys.readouterr().out
    assert "failure classes" in out and f"pin {pin} of {ecu}" in out
    assert len(root.Systems) == 0


@pytest.fixture
def kr60_bench(root, make_document):
    """A connected KR60 system with the pattern "Loads" of pins A12 and 1 of
    ABS_ESP, class 1 each."""
    system = root.Systems.Open(make_document("KR60"))
    pattern = system.FailurePatterns.Add("Loads")
    pins = [pattern.Pins.Add("A12", "ECM"), pattern.Pins.Add("1", "ABS_ESP")]
    for pin in pins:
        pin.SetFailureClass(1)
    system.Connect()
    return system, pattern, pins


A12_ON = "LOAD 0x011: channel 1 relay 2 on"
ABS_ON = "LOAD 0x013: channel 1 relay 2 on"


@pytest.mark.parametrize(
    "chosen, relays",
    [
        (None, [A12_ON, ABS_ON]),
        ([1], [ABS_ON]),
        ((0,), [A12_ON]),  # a tuple is a list too
        ([0, 1], [A12_ON, ABS_ON]),
        ([], faultbox.E_FAULTBOX),  # no pin selected: message 89
    ],
)
def test_activate_by_pin_list(kr60_bench, chosen, relays):
    system, pattern, pins = kr60_bench
    if chosen is None:
        pattern.Activate()
    elif relays == faultbox.E_FAULTBOX:
        expect_failure(relays, pattern.Activate, chosen)
        assert faultbox.sim_relays(system) == ALL_OFF
        return
    else:
        pattern.Activate(type(chosen)(pins[i] for i in chosen))
    assert faultbox.sim_relays(system) == relays
    assert [pin.IsActivated() for pin in pins] == [r in relays for r in (A12_ON, ABS_ON)]
    pattern.Deactivate(Pins=pins)
    assert faultbox.sim_relays(system) == ALL_OFF


@pytest.mark.parametrize("argument", [[5], ["A12"], [None], 0, "A12", "pins"])
def test_activate_refuses_what_is_no_pin_list(kr60_bench, argument):
    system, pattern, pins = kr60_bench
    expect_failure(faultbox.E_FAULTBOX_INVALID_PARAMETER, pattern.Activate, argument)
    expect_failure(faultbox.E_FAULTBOX_INVALID_PARAMETER, pattern.Activate, [pins[0], argument])
    assert faultbox.sim_relays(system) == ALL_OFF
    assert pattern.IsActivated() is False


def test_a_pin_of_another_pattern_is_refused(kr60_bench):
    system, pattern, pins = kr60_bench
    other = system.FailurePatterns.Add("Other").Pins.Add("A13", "ECM")
    expect_failure(faultbox.E_FAULTBOX_INVALID_PARAMETER, pattern.Activate, [pins[0], other])
    assert faultbox.sim_relays(system) == ALL_OFF


def test_a_pin_without_a_class_is_not_activated(kr60_bench):
    system, pattern, pins = kr60_bench
    bare = pattern.Pins.Add("A13", "ECM")
    assert bare.AdjustedFailureClass is None
    for activate in (bare.Activate, lambda: pattern.Activate([bare])):
        expect_failure(faultbox.E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED, activate)
        assert faultbox.sim_relays(system) == ALL_OFF
        assert pattern.IsActivated() is False


@pytest.mark.parametrize("platform", ["KR60", "KR40"])
def test_a_system_stays_on_its_simulated_bench(root, make_document, settings_with, caplog, platform):
    """Closing one system, or opening another on other hardware, never moves
    a system off its simulated bench onto the settings' port or bus."""
    with socket.socket() as listener:
        listener.bind(("127.0.0.1", 0))
        listener.listen()
        listener.setblocking(False)
        watched, terminal = os.openpty()
        try:
            os.set_blocking(watched, False)
            settings_with(
                "[Components\\Faultbox.Component\\Hardware\\CAN]\n"
                f"*,*,*=tcp:127.0.0.1:{listener.getsockname()[1]}/watched\n"
                "[Components\\Faultbox.Component\\Hardware\\SerialPorts]\n"
                f"COM1={os.ttyname(terminal)}\n"
            )
            b = root.Systems.Open(make_document(platform, "b"))
            c = root.Systems.Open(make_document(platform, "c"))
            c.Close()
            root.SelectHardware("config")
            try:
                root.Systems.Open(make_document(platform, "a"))
            finally:
                root.SelectHardware("sim")
            pin = b.FailurePatterns.Add("Stays").Pins.Add(*(("A12", "ECM") if platform == "KR60" else ("X1.1", "BCM")))
            pin.SetFailureClass(1)
            caplog.set_level(logging.WARNING, logger="faultbox")
            b.Connect()
            pin.Activate()
            assert faultbox.sim_relays(b) != ALL_OFF
            pin.Deactivate()
            assert faultbox.sim_relays(b) == ALL_OFF
            b.Disconnect()
            # The settings' bus and port heard nothing: every byte and frame went to the bench.
            with pytest.raises(BlockingIOError):
                listener.accept()
            with pytest.raises(BlockingIOError):
                os.read(watched, 1)
        finally:
            os.close(watched)
            os.close(terminal)
    warned = [r for r in caplog.records if r.name == "faultbox" and r.number == 941]
    assert len(warned) == 1 and warned[0].levelno == logging.WARNING
    assert "no real relay moves" in warned[0].getMessage()


def test_reset_of_an_activated_pattern_or_pin_is_refused(kr60_bench):
    system, pattern, pins = kr60_bench
    pins[0].Activate()
    assert system.FailurePatterns.ActivatedFailurePattern is pattern
    config = pins[0].PinConfig
    for member in (pattern.Reset, pins[0].Reset):
        error = expect_failure(faultbox.E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED, member)
        assert error.description
        assert pins[0].PinConfig == config and pins[0].AdjustedFailureClassID == (1, 0)
        assert faultbox.sim_relays(system) == [A12_ON]
    # The failures say why (messages 85, 97 and 169).
    error = expect_failure(faultbox.E_FAULTBOX, system.Close)
    assert "has an activated pattern" in error.description
    other = system.FailurePatterns.Add("Other")
    other.Pins.Add("A13", "ECM").SetFailureClass(1)
    error = expect_failure(faultbox.E_FAULTBOX, other.Activate)
    assert "Pattern Loads of this system is activated" in error.description
    error = expect_failure(faultbox.E_FAULTBOX, system.SetInterfaceParameter, faultbox.fdtCAN_IF_LINKBOX_USB, 1, 1)
    assert "cannot be changed while the system is connected" in error.description
    expect_failure(faultbox.E_FAULTBOX_DISCONNECT, system.Disconnect)
    pins[0].Deactivate()
    system.ResetHardware()
    system.Disconnect()
    expect_failure(faultbox.E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE, system.ResetHardware)


def test_messages_go_to_logging(kr60_bench, caplog, tmp_path):
    system, pattern, pins = kr60_bench
    caplog.set_level(logging.DEBUG, logger="faultbox")
    pattern.Activate()
    pattern.Deactivate()
    with pytest.raises(faultbox.FaultboxError):
        faultbox.FaultInjection().Systems.Open(str(tmp_path / "missing.fsa"))
    pattern.Activate()
    with pytest.raises(faultbox.FaultboxError):
        pattern.Pins.Remove(0)
    records = {record.number: record for record in caplog.records if record.name == "faultbox"}
    for number, level, text in [
        (165, logging.INFO, "Loads"),
        (167, logging.INFO, "Loads"),
        (46, logging.ERROR, "missing.fsa"),
        (45, logging.WARNING, "A12"),
    ]:
        assert number in records, sorted(records)
        assert records[number].levelno == level
        assert records[number].getMessage().startswith(f"{number}: ")
        assert text in records[number].getMessage()


def test_a_logging_handler_may_call_the_module(kr60_bench):
    """A message is handed to logging while the call that reported it runs."""
    system, pattern, pins = kr60_bench
    seen = []

    class Handler(logging.Handler):
        def emit(self, record):
            seen.append((record.number, pattern.IsActivated()))

    handler = Handler()
    logger = logging.getLogger("faultbox")
    level = logger.level
    logger.setLevel(logging.INFO)
    logger.addHandler(handler)
    try:
        pattern.Activate()
    finally:
        logger.removeHandler(handler)
        logger.setLevel(level)
    assert (165, True) in seen


def test_calls_from_several_threads(kr60_bench):
    system, pattern, pins = kr60_bench
    errors = []

    def switch():
        try:
            for _ in range(5):
                pattern.Activate()
                pattern.Deactivate()
        except Exception as error:  # noqa: BLE001 - reported below
            errors.append(error)

    def read():
        try:
            for _ in range(200):
                assert [pin.Name for pin in pattern.Pins] == ["A12", "1"]
                assert system.IsConnected()
        except Exception as error:  # noqa: BLE001
            errors.append(error)

    threads = [threading.Thread(target=switch)] + [threading.Thread(target=read) for _ in range(3)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    assert errors == []
    assert faultbox.sim_relays(system) == ALL_OFF


SCRIPT_LEFT_ACTIVATED = """
import logging, sys
import faultbox
logging.basicConfig(level=logging.INFO, format="%(levelname)s %(message)s", stream=sys.stdout)
system = faultbox.FaultInjection().Systems.Open(sys.argv[1])
pattern = system.FailurePatterns.Add("Left on")
pattern.Pins.Add("A12", "ECM").SetFailureClass(1)
system.Connect()
pattern.Activate()
print("script ends")
"""


def run_left_activated(document, tmp_path, **environment):
    script = tmp_path / "left_on.py"
    script.write_text(SCRIPT_LEFT_ACTIVATED)
    return subprocess.run(
        [sys.executable, str(script), document],
        capture_output=True, text=True, env=dict(os.environ, **environment), check=False, timeout=100,
    )


def test_exit_deactivates_and_disconnects(make_document, tmp_path):
    # The variable asks for the simulator, as SelectHardware("sim") does.
    result = run_left_activated(make_document("KR60"), tmp_path, FAULTBOX_HARDWARE="sim")
    assert result.returncode == 0, result.stdout + result.stderr
    before, after = result.stdout.split("script ends", 1)
    assert "WARNING 941: " in before and "no real relay moves" in before, result.stdout
    # Deactivated (167), then disconnected (103).
    assert 0 <= after.find("INFO 167: ") < after.find("INFO 103: "), result.stdout


def test_exit_with_relays_that_may_still_be_switched_fails(make_document, tmp_path, settings_with, hub_bench):
    """LOAD 0x011 (pin A12) takes the reset and the activation, then refuses
    the deactivation and the resets after it."""
    document = make_document("KR60")
    target = hub_bench(tmp_path / "kr60_bench.csv", "--fault", "refuse", "--fault-module", "load:11",
                       "--fault-after", "4")
    # Long enough for the answers over the hub on a busy machine.
    settings_with(f"[Components\\Faultbox.Component\\Hardware\\CAN]\n*,*,*={target}\n", collection_wait=2000)
    result = run_left_activated(document, tmp_path)
    assert result.returncode == 1, result.stdout + result.stderr
    after = result.stdout.split("script ends", 1)[1]
    assert "ERROR 942: Module LOAD 0x11 " in after, result.stdout
    assert "ERROR 944: " in after and "may still be switched" in after, result.stdout
