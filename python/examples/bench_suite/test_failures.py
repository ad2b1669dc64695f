"""An example suite of bench tests: each inserts failures of a sample bench
(data/kr60_bench.csv or data/kr40_bench.csv) and takes them out again. The
checks of the ECUs' reactions would go where the comments say; on the
built-in simulator the tests look at the relays the bench switched.
"""

from typing import Dict, Iterator, List, Tuple

import pytest

import faultbox

# The failures of each sample bench: (ECU, pin, failure class).
FAILURES: Dict[faultbox.FSPlatformType, List[Tuple[str, str, int]]] = {
    faultbox.fptKR60Platform: [("ECM", "A12", 1), ("ABS_ESP", "1", 1)],
    faultbox.fptKR40Platform: [("BCM", "X1.1", 1), ("SEAT_CTRL", "A1", 3)],
}


@pytest.fixture
def pattern(faultbox_system: faultbox.System) -> Iterator[faultbox._BaseFailurePattern]:
    """A pattern of the bench's failures, removed after the test."""
    patterns = faultbox_system.FailurePatterns
    pattern = patterns.Add("Example suite")
    for ecu, pin, failure_class in FAILURES[faultbox_system.PlatformType]:
        pattern.Pins.Add((ecu, pin)).SetFailureClass(failure_class)
    yield pattern
    patterns.Remove(pattern.Name)


def relays_on(system: faultbox.System) -> List[str]:
    """The relays the simulated bench switched on; [] on real hardware."""
    return [line for line in faultbox.sim_relays(system) if line != "all relays off"]


def test_each_failure_alone(faultbox_system: faultbox.System, pattern: faultbox._BaseFailurePattern) -> None:
    for pin in pattern.Pins:
        with pattern.activated([pin]):
            assert [each.IsActivated() for each in pattern.Pins] == [each is pin for each in pattern.Pins]
            # ... check that the ECU of `pin` reports the failure ...
            if faultbox.sim_relays(faultbox_system):
                assert len(relays_on(faultbox_system)) == 1
        assert relays_on(faultbox_system) == []


def test_all_failures_at_once(faultbox_system: faultbox.System, pattern: faultbox._BaseFailurePattern) -> None:
    with pattern.activated():
        assert all(pin.IsActivated() for pin in pattern.Pins)
        # ... check that every ECU reports its failure ...
    assert not pattern.IsActivated() and relays_on(faultbox_system) == []


def test_a_failed_check_leaves_the_bench_off(
    faultbox_system: faultbox.System, pattern: faultbox._BaseFailurePattern
) -> None:
    with pytest.raises(AssertionError):
        with pattern.activated():
            assert False, "the ECU did not report the failure"
    assert not pattern.IsActivated() and relays_on(faultbox_system) == []
