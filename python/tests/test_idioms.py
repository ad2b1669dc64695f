"""The module as Python scripts use it, on the simulated benches: with-blocks
that leave the bench off, collections as sequences, error families, help
texts and reprs. The file is typed: test_package runs mypy --strict on it."""

from __future__ import annotations

import logging
import os
import pathlib
import pty
import pydoc
from typing import Any, Callable, Dict, Iterator, List, Tuple, Type

import pytest

import faultbox

ALL_OFF = ["all relays off"]
A12_ON = "LOAD 0x011: channel 1 relay 2 on"
ABS_ON = "LOAD 0x013: channel 1 relay 2 on"


@pytest.fixture
def bench(root: faultbox._FaultInjection, make_document: Callable[..., str]) -> faultbox.System:
    """A KR60 system with the pattern "Loads" of pins A12 of ECM and 1 of
    ABS_ESP, failure class 1 each."""
    system = root.Systems.Open(pathlib.Path(make_document("KR60")))
    pins = system.FailurePatterns.Add("Loads").Pins
    pins.Add(("ECM", "A12")).SetFailureClass(1)
    pins.Add("1", "ABS_ESP").SetFailureClass(1)
    return system


@pytest.mark.parametrize("interruption", [RuntimeError, KeyboardInterrupt])
def test_with_blocks_leave_the_bench_off(
    root: faultbox._FaultInjection, bench: faultbox.System, caplog: pytest.LogCaptureFixture,
    interruption: Type[BaseException],
) -> None:
    caplog.set_level(logging.INFO, logger="faultbox")
    with bench as system:
        pattern = system.FailurePatterns["Loads"]
        with system.connected() as connected:
            assert connected is system and system.IsConnected()
            with pytest.raises(interruption):
                with pattern.activated([pattern.Pins["ECM", "A12"]]) as active:
                    assert active is pattern
                    assert faultbox.sim_relays(system) == [A12_ON]
                    raise interruption("the check on the bench failed")
            assert faultbox.sim_relays(system) == ALL_OFF and not pattern.IsActivated()
            with pattern.activated():
                assert faultbox.sim_relays(system) == [A12_ON, ABS_ON]
            assert faultbox.sim_relays(system) == ALL_OFF
            pattern.Activate()
        # Leaving connected() deactivated the pattern before it disconnected.
        assert not system.IsConnected() and not pattern.IsActivated()
        system.Connect()
        pattern.Activate()
        caplog.clear()
    # Leaving the system's block deactivated, disconnected and closed it.
    assert len(root.Systems) == 0 and not system._attached
    numbers = [getattr(record, "number") for record in caplog.records if record.name == "faultbox"]
    assert numbers.index(167) < numbers.index(103), numbers


def test_closing_or_removing_in_a_for_loop_reaches_every_member(
    root: faultbox._FaultInjection, make_document: Callable[..., str]
) -> None:
    root.Systems.Open(make_document("KR40", "first"))
    system = root.Systems.Open(make_document("KR60", "second"))
    patterns = system.FailurePatterns
    for name in ("a", "b", "c"):
        patterns.Add(name)
    for pattern in patterns:
        patterns.Remove(pattern.Name)
    assert len(patterns) == 0
    for each in root.Systems:
        each.Close()
    assert len(root.Systems) == 0


def test_the_live_enumerator_sees_what_is_appended(
    root: faultbox._FaultInjection, make_document: Callable[..., str]
) -> None:
    first = root.Systems.Open(make_document("KR40", "first"))
    seen = []
    for system in root.Systems._NewEnum:
        seen.append(system)
        if len(seen) == 1:
            root.Systems.Open(make_document("KR60", "later"))
    assert seen == [first, root.Systems[1]]
    assert [system.Name for system in root.Systems] == root.Systems.Names


Lookup = Callable[[faultbox.FailurePatternPins], object]


@pytest.mark.parametrize(
    "lookup, expected",
    [
        (lambda pins: len(pins), 3),
        (lambda pins: [pin.Name for pin in pins], ["A12", "1", "A13"]),
        (lambda pins: pins[0].Name, "A12"),
        (lambda pins: pins[-1].Name, "A13"),
        (lambda pins: pins["1"].EcuName, "ABS_ESP"),
        (lambda pins: pins["ABS_ESP", "1"].Name, "1"),
        (lambda pins: [pin.Name for pin in pins[1:]], ["1", "A13"]),
        (lambda pins: pins[5:], []),
        (lambda pins: pins.Item("A13", "ECM").Name, "A13"),  # the model's order: pin first
        (lambda pins: ("ECM", "A12") in pins, True),
        (lambda pins: ("A12", "ECM") in pins, False),
        (lambda pins: "A13" in pins, True),
        (lambda pins: pins[0] in pins, True),
        (lambda pins: 0 in pins, False),
        (lambda pins: pins[-4], faultbox.NotFoundError),
        (lambda pins: pins[3], IndexError),
        (lambda pins: pins["ECM", "B1"], KeyError),
        (lambda pins: pins[0.5], TypeError),
        (lambda pins: pins["ECM", "A12", "x"], TypeError),
    ],
)
def test_collections_are_sequences(bench: faultbox.System, lookup: Lookup, expected: object) -> None:
    pins = bench.FailurePatterns["Loads"].Pins
    pins.Add(("ECM", "A13"))
    if isinstance(expected, type) and issubclass(expected, Exception):
        with pytest.raises(expected):
            lookup(pins)
    else:
        assert lookup(pins) == expected


def test_pins_are_added_and_removed_in_both_orders(bench: faultbox.System) -> None:
    pins = bench.FailurePatterns["Loads"].Pins
    assert pins.Add("A13", "ECM") is pins.Add(("ECM", "A13")) is pins["ECM", "A13"]
    pins.Remove(("ECM", "A13"))
    pins.Remove("1", "ABS_ESP")
    assert pins.Names == [("ECM", "A12")]


@pytest.fixture
def silent_port(settings_with: Callable[[str], None]) -> Iterator[int]:
    """COM9 of the settings: a pseudo-terminal nobody answers on."""
    controller, device = pty.openpty()
    settings_with("[Components\\Faultbox.Component\\Hardware\\SerialPorts]\nCOM9=%s\n" % os.ttyname(device))
    yield 9
    os.close(controller)
    os.close(device)


def _timeout(root: faultbox._FaultInjection, document: str, port: int) -> None:
    root.SelectHardware("config")
    try:
        system = root.Systems.Open(document)
    finally:
        root.SelectHardware("sim")
    system.SetInterfaceParameter(faultbox.fdtRS232_IF_PORT, port)
    system.Connect()  # a bench that does not answer is still connected ...
    system.ResetHardware()  # ... but its reset hears nothing


def _other_pattern_activated(system: faultbox.System) -> None:
    system.Connect()
    system.FailurePatterns["Loads"].Activate()
    other = system.FailurePatterns.Add("Other")
    other.Pins.Add(("ECM", "A13")).SetFailureClass(1)
    other.Activate()


@pytest.mark.parametrize(
    "family, code, number",
    [
        (faultbox.FileError, faultbox.E_FAULTBOX_CANN_NOT_OPEN_FILE, 46),
        (faultbox.NotConnectedError, faultbox.E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE, 120),
        (faultbox.InterlockError, faultbox.E_FAULTBOX, 97),
        (faultbox.HardwareTimeoutError, faultbox.E_FAULTBOX_TIME_OUT, None),
    ],
)
def test_error_families(
    root: faultbox._FaultInjection, bench: faultbox.System, make_document: Callable[..., str],
    silent_port: int, family: Type[faultbox.FaultboxError], code: faultbox.FaultboxErrors, number: Any,
) -> None:
    actions: Dict[type, Callable[[], object]] = {
        faultbox.FileError: lambda: root.Systems.Open(pathlib.Path(bench.Name).with_name("missing.fsa")),
        faultbox.NotConnectedError: lambda: bench.FailurePatterns["Loads"].Activate(),
        faultbox.InterlockError: lambda: _other_pattern_activated(bench),
        faultbox.HardwareTimeoutError: lambda: _timeout(root, make_document("KR40"), silent_port),
    }
    with pytest.raises(family) as caught:
        actions[family]()
    error = caught.value
    assert isinstance(error, faultbox.FaultboxError) and type(error) is family
    assert error.code is code and error.hresult == code and error.description
    if number is not None:
        assert number in [message.number for message in error.messages], error.messages
        assert all(str(message).startswith("%d: " % message.number) for message in error.messages)


def test_help_texts_and_version() -> None:
    assert "Connect this failure simulation system to Norvik hardware" in pydoc.render_doc(faultbox.System.Connect)
    assert "Names, format:((ECUName,PINName)" in pydoc.render_doc(faultbox.FailurePatternPins)
    for cls in (faultbox._FaultInjection, faultbox.Systems, faultbox.System, faultbox.FailurePatterns,
                faultbox.FailurePatternKR60, faultbox.FailurePatternPins, faultbox.FailurePatternKR60Pin,
                faultbox.FailurePatternKR40Pin, faultbox.FailureClasses, faultbox.FailureClass, faultbox.Enumerator):
        assert cls.__module__ == "faultbox" and cls.__doc__
        undocumented = [name for name in dir(cls) if not name.startswith("__") and not getattr(cls, name).__doc__]
        assert undocumented == [], cls
    for enumeration in (faultbox.FSPlatformType, faultbox.FSDeviceType, faultbox.FSFailurePattern,
                        faultbox.FSDeviceConstant, faultbox.FaultboxErrors):
        assert all(member.__doc__ and member.name in (enumeration.__doc__ or "") for member in enumeration)
    assert faultbox.E_FAULTBOX_TIME_OUT.__doc__ == "The time out for receive messages is elapsed"
    assert faultbox.__version__.count(".") == 2


def test_reprs_name_the_real_type(root: faultbox._FaultInjection, bench: faultbox.System) -> None:
    pattern = bench.FailurePatterns["Loads"]
    bench.Connect()
    pattern.Activate()
    expected: List[Tuple[object, str]] = [
        (root, "<faultbox._FaultInjection 'Faultbox.Component' (1 system)>"),
        (root.Systems, "<faultbox.Systems (1 system)>"),
        (bench, "<faultbox.System %r (KR60, connected)>" % bench.Name),
        (bench.FailurePatterns, "<faultbox.FailurePatterns (1 pattern, 'Loads' activated)>"),
        (pattern, "<faultbox.FailurePatternKR60 'Loads' (2 pins, activated)>"),
        (pattern.Pins, "<faultbox.FailurePatternPins (2 pins)>"),
        (pattern.Pins[0], "<faultbox.FailurePatternKR60Pin ('ECM', 'A12') (class 1/0, activated)>"),
        (bench.FailureClasses[0], "<faultbox.FailureClass 1 %r>" % bench.FailureClasses[0].Name),
        (root.Systems._NewEnum, "<faultbox.Enumerator>"),
    ]
    assert [repr(item) for item, _ in expected] == [text for _, text in expected]
    assert repr(bench.FailureClasses).startswith("<faultbox.FailureClasses (")
    pattern.Deactivate()
    bench.Close()
    assert repr(pattern) == "<faultbox.FailurePatternKR60 (no longer exists)>"
