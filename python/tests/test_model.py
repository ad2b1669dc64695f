"""The object model as Python sees it: arguments of every Python kind,
results, the enumerator, errors and constants."""

import gc
import logging
import os

import pytest

import faultbox
from conftest import expect_failure

INVALID = faultbox.E_FAULTBOX_INVALID_PARAMETER
NOT_A_NUMBER = "The index is neither a name nor a number."
KEPT_TEXT = "The object no longer exists: its system or failure pattern was closed or deleted."


@pytest.fixture
def two_systems(root, make_document):
    first = root.Systems.Open(make_document("KR40", "first"))
    second = root.Systems.Open(make_document("KR60", "second"))
    return first, second


def test_root_and_constants(root):
    assert root.Name == "Faultbox.Component"
    assert faultbox.FaultInjection() is root
    assert faultbox.E_FAULTBOX_TIME_OUT == 0x80040412
    assert faultbox.E_FAULTBOX == faultbox.FaultboxErrors.E_FAULTBOX == 0x80004005
    assert faultbox.FSPlatformType.fptKR60Platform == faultbox.fptKR60Platform == 2
    assert faultbox.FSDeviceType.fdtRS232_IF_PORT == 200
    assert faultbox.FSFailurePattern.ffpActivated == 1
    assert faultbox.FSDeviceConstant.fdcConnected == 1
    assert len(faultbox.FaultboxErrors) == 28


@pytest.mark.parametrize(
    "index, expected",
    [
        (0, 0),
        (1, 1),
        (True, None),  # -1
        (0.4, 0),
        (0.5, 0),  # halves round to the even neighbour
        (1.5, None),  # 2 = Count
        (2, None),
        (-1, None),
        (2**70, None),
        ("0", None),  # a text is always a name
        (None, NOT_A_NUMBER),
        ([], NOT_A_NUMBER),
        ((0,), NOT_A_NUMBER),
        ({}, NOT_A_NUMBER),
        (b"0", NOT_A_NUMBER),
        (object(), NOT_A_NUMBER),
    ],
)
def test_systems_item_by_every_python_kind(two_systems, root, index, expected):
    if isinstance(expected, int):
        assert root.Systems.Item(index) is two_systems[expected]
        return
    error = expect_failure(INVALID, root.Systems.Item, index)
    if expected is not None:
        assert error.description == NOT_A_NUMBER


def test_a_model_object_is_not_an_index(two_systems, root):
    error = expect_failure(INVALID, root.Systems.Item, two_systems[0])
    assert error.description == NOT_A_NUMBER


def test_enumerator(two_systems, root):
    enumerator = root.Systems._NewEnum
    assert enumerator.Next(5) == list(two_systems)  # fewer than asked: the end
    assert list(enumerator) == []
    enumerator.Reset()
    assert list(enumerator) == list(two_systems)
    enumerator.Reset()
    enumerator.Skip()
    assert enumerator.Next() == [two_systems[1]]
    enumerator.Reset()
    expect_failure(INVALID, enumerator.Skip, 2)
    assert enumerator.Next() == []
    error = expect_failure(faultbox.E_NOTIMPL, enumerator.Clone)
    assert not isinstance(error.hresult, faultbox.FaultboxErrors)


def test_system_values(root, make_document):
    document = make_document("KR60")
    system = root.Systems.Open(document)
    assert system.Name == document
    assert system.PinFile.endswith("kr60_bench.csv")
    assert system.PlatformType is faultbox.FSPlatformType.fptKR60Platform
    assert system.ECUVersion == 1
    assert system.IsConnected() is False
    assert root.ConnectedSystem == []
    assert isinstance(system.Author, str) and isinstance(system.Description, str)


@pytest.mark.parametrize(
    "platform, arguments, expected",
    [
        ("KR40", (faultbox.fdtRS232_IF_PORT, 7), (200, 7)),
        ("KR40", (faultbox.fdtRS232_IF_PORT, "12"), (200, 12)),
        ("KR40", (faultbox.fdtRS232_IF_PORT, 0), INVALID),
        ("KR40", (faultbox.fdtRS232_IF_PORT, "seven"), INVALID),
        ("KR60", (faultbox.fdtCAN_IF_LINKBOX_USB, 1, 2), (4, 1, 2)),
        ("KR60", (faultbox.fdtCAN_IF_VI_CAN_CARD_X, 0, 256), INVALID),
        ("KR60", (faultbox.fdtCAN_IF_VI_CAN_CARD_X, 3.0, [1]), INVALID),
    ],
)
def test_interface_parameter(root, make_document, platform, arguments, expected):
    system = root.Systems.Open(make_document(platform))
    if expected == INVALID:
        before = system.InterfaceParameter()
        expect_failure(INVALID, system.SetInterfaceParameter, *arguments)
        assert system.InterfaceParameter() == before
        return
    system.SetInterfaceParameter(*arguments)
    result = system.InterfaceParameter()
    assert isinstance(result, tuple) and len(result) == 3
    assert result[: len(expected)] == expected
    # Omitted values keep the ones set.
    system.SetInterfaceParameter(arguments[0])
    assert system.InterfaceParameter() == result


def test_a_kept_reference_of_a_closed_system(root, make_document):
    system = root.Systems.Open(make_document("KR60"))
    patterns = system.FailurePatterns
    pattern = patterns.Add("Kept")
    pin = pattern.Pins.Add("A12", "ECM")
    failure_class = system.FailureClasses[0]
    system.Close()
    assert len(root.Systems) == 0
    members = [
        lambda: system.Name,
        system.Connect,
        system.IsConnected,
        lambda: system.FailurePatterns,
        lambda: len(patterns),
        lambda: pattern.Name,
        pattern.Activate,
        lambda: pin.PinConfig,
        lambda: failure_class.ID,
        lambda: list(patterns),
    ]
    for member in members:
        error = expect_failure(faultbox.E_FAULTBOX, member)
        assert error.description == KEPT_TEXT
    assert "no longer exists" in repr(system)
    del system, patterns, pattern, pin, failure_class, members
    gc.collect()


def test_faultbox_error(root, tmp_path):
    missing = str(tmp_path / "missing.fsa")
    error = expect_failure(faultbox.E_FAULTBOX_CANN_NOT_OPEN_FILE, root.Systems.Open, missing)
    assert isinstance(error, Exception)
    assert error.hresult is faultbox.FaultboxErrors.E_FAULTBOX_CANN_NOT_OPEN_FILE
    assert missing in error.description
    assert "E_FAULTBOX_CANN_NOT_OPEN_FILE, 0x80040400" in str(error)
    assert error.args == (error.hresult, error.description)
    assert [(message.number, message.level) for message in error.messages] == [(46, logging.ERROR)]


@pytest.mark.parametrize("text", ["Müller Prüfstand", "bench \udcff latin-1"])
def test_texts_keep_their_bytes(root, make_document, text):
    system = root.Systems.Open(make_document("KR60"))
    pattern = system.FailurePatterns.Add(text)
    assert pattern.Name == text
    assert system.FailurePatterns[text] is pattern


def test_pattern_and_pin_collections(root, make_document):
    system = root.Systems.Open(make_document("KR40"))
    patterns = system.FailurePatterns
    assert patterns.ActivatedFailurePattern is None
    pattern = patterns.Add("Doors")
    assert isinstance(pattern, faultbox.FailurePatternKR40)
    unnamed = patterns.Add()
    assert unnamed.Name and unnamed.Name != "Doors"

    pins = pattern.Pins
    first = pins.Add("X1.1", "BCM")
    second = pins.Add(PinName="X1.1", EcuName="DCU_FL")
    assert isinstance(first, faultbox.FailurePatternKR40Pin)
    assert pins.Add("X1.1", "BCM") is first
    assert pins.Names == [("BCM", "X1.1"), ("DCU_FL", "X1.1")]
    assert pins.Item("X1.1", EcuName="DCU_FL") is second
    assert first.AdjustedFailureClass is None
    assert first.AdjustedFailureClassID == (0, -1)
    assert first.DefinedFailureClasses == [1, 2, 3]
    assert first.ModuleAddress == 0x10

    first.SetFailureClass(2, RelayVector=1)
    assert first.AdjustedFailureClassID == (2, 1)
    assert first.AdjustedFailureClass.ID == 2
    expect_failure(INVALID, first.SetFailureClass, 2, "one")
    pins.Remove("X1.1", "DCU_FL")
    assert list(pins) == [first]
    patterns.Remove("Doors")
    expect_failure(faultbox.E_FAULTBOX, lambda: pattern.Name)
    assert patterns.Names == [unnamed.Name]


def test_kr60_pattern_values(root, make_document):
    system = root.Systems.Open(make_document("KR60"))
    pattern = system.FailurePatterns.Add("Shorts")
    assert isinstance(pattern, faultbox.FailurePatternKR60)
    assert pattern.FIURelayState == "0xFFFFFFFFFFFFFFFF"
    pin = pattern.Pins.Add("A12", "ECM")
    assert isinstance(pin, faultbox.FailurePatternKR60Pin)
    assert pin.ModuleAddress == (0, 1, 1)
    pin.SetFailureClass(2)  # FIU relays 5 and 10
    assert pattern.FIURelayState == "0x%X" % (2**64 - 1 - (1 << 0) - (1 << 5))
    pattern.ResistorValue = 100
    assert pattern.ResistorValue == 100
    with pytest.raises(faultbox.FaultboxError):
        pattern.ResistorValue = 0x20000
    assert pattern.RsimRelayState.startswith("0x")


def test_save_keeps_what_the_script_built(root, make_document):
    document = make_document("KR40")
    system = root.Systems.Open(document)
    pattern = system.FailurePatterns.Add("Saved")
    pattern.Pins.Add("A1", "SEAT_CTRL").SetFailureClass(3)
    system.Save()
    system.Close()
    reopened = root.Systems.Open(document)
    pin = reopened.FailurePatterns["Saved"].Pins[0]
    assert (pin.Name, pin.EcuName, pin.AdjustedFailureClassID) == ("A1", "SEAT_CTRL", (3, 0))


def _read_only(system, document):
    os.chmod(document, 0o444)
    return system.FailurePatterns


# A failure tells why: the member's own text, or the text of the message the
# model reported on the way when the code alone says no more than "failed".
@pytest.mark.parametrize(
    "platform, call, code, says",
    [
        ("KR40", lambda s, d: s.FailurePatterns.Add("Doors"), faultbox.E_FAULTBOX_NAME_NOT_UNIQUE,
         "A failure pattern named Doors exists already"),
        ("KR40", lambda s, d: s.FailurePatterns["Nope"], INVALID,
         'No failure pattern has this name or position: "Nope".'),
        ("KR40", lambda s, d: s.FailurePatterns["Doors"].Pins.Item("X9.9", "BCM"), INVALID,
         'No pin of the pattern has this name or position: "X9.9" of ECU "BCM".'),
        ("KR40", lambda s, d: s.FailurePatterns["Doors"].Pins.Add("X9.9", "BCM"), INVALID,
         "There is no pin X9.9 of ECU BCM in the system's pin files"),
        ("KR40", lambda s, d: s.FailureClasses.Item(99), INVALID,
         "No failure class has this name or position: 99 (positions 0 to 5)."),
        ("KR40", lambda s, d: s.FailurePatterns["Doors"].Pins[0].SetFailureClass(6), faultbox.E_FAULTBOX,
         "The failure class is not defined for pin X1.1"),  # message 130
        ("KR60", lambda s, d: s.SetInterfaceParameter(faultbox.fdtRS232_IF_PORT, 1), faultbox.E_FAULTBOX,
         "The device type does not suit the platform"),  # message 57
        ("KR40", lambda s, d: _read_only(s, d).Add("Late"), faultbox.E_FAULTBOX,
         "is write-protected: the change is refused"),  # message 118
    ],
)
def test_failures_say_why(root, make_document, platform, call, code, says):
    document = make_document(platform)
    system = root.Systems.Open(document)
    if platform == "KR40":
        system.FailurePatterns.Add("Doors").Pins.Add("X1.1", "BCM")
    error = expect_failure(code, call, system, document)
    assert says in error.description, error.description
    assert "unspecified" not in str(error)


def test_refusal_reason_of_a_pin(root, make_document, tmp_path):
    document = make_document("KR40")
    # Class 7 is not in the sample failure class file.
    pins = tmp_path / "kr40_bench.csv"
    pins.write_bytes(pins.read_bytes().replace(b"X1.2;BCM;1,2;", b"X1.2;BCM;7;"))
    system = root.Systems.Open(document)
    pattern = system.FailurePatterns.Add("Reasons")
    held = pattern.Pins.Add("X1.1", "BCM")
    refused = pattern.Pins.Add("X1.2", "BCM")
    held.SetFailureClass(1)
    assert held.RefusalReason == ""
    assert refused.RefusalReason == "None of the pin's failure classes (7) is in the system's failure class file."
    assert refused.CanBeActivated() is False


def test_one_file_is_one_document(root, make_document, tmp_path):
    first = make_document("KR40", "Bench")
    other = make_document("KR40", "bench")  # another file: Linux names regard case
    link = tmp_path / "link.fss"
    link.symlink_to(first)
    system = root.Systems.Open(first)
    assert root.Systems.Open(str(link)) is system
    assert root.Systems[str(link)] is system
    assert root.Systems.Open(other) is not system
    assert len(root.Systems) == 2
    # The open document keeps its pin file: another one is refused, not ignored.
    moved = tmp_path / "moved.csv"
    moved.write_bytes((tmp_path / "kr40_bench.csv").read_bytes())
    error = expect_failure(INVALID, root.Systems.Open, first, str(moved))
    assert "is open already, with the pin file" in error.description
    assert root.Systems.Open(first, str(tmp_path / "kr40_bench.csv")) is system
