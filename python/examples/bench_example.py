#!/usr/bin/python3
"""Inserts one failure on a HIL bench and takes it out again.

Opens the bench's document, lists its failure classes, builds a pattern with
one pin, activates it, checks the pin and deactivates. It drives the hardware
the settings name; with --hardware sim it runs on the built-in simulator
instead and also shows the relays the simulated bench switched.

    PYTHONPATH=build/python NORVIK_ROOT=build/data/norvik \\
        /usr/bin/python3 bench_example.py chassis.fsa ECM A12 1 --hardware sim
"""

import argparse
import logging
import sys
from typing import Dict, List

import faultbox


def run(document: str, ecu_name: str, pin_name: str, class_id: int, hardware: str) -> Dict[str, List[str]]:
    """Runs the example on `document`; answers the simulated bench's relays
    while the pattern was activated and after it was deactivated."""
    root = faultbox.FaultInjection()
    root.SelectHardware(hardware)  # extension: "sim" or "config"
    relays: Dict[str, List[str]] = {}
    # The block closes the system at its end, deactivating and disconnecting
    # first, also when a step fails or Ctrl-C stops the script.
    with root.Systems.Open(document) as system:
        print(f"{system.Name}: {system.PlatformType.name}, pin file {system.PinFile}")

        classes = system.FailureClasses
        print(f"{len(classes)} failure classes ({classes.Version}):")
        for failure_class in classes:
            print(f"  {failure_class.ID:3}  {failure_class.Name}")

        # A pattern of one pin (both calls are extensions of the model).
        pattern = system.FailurePatterns.Add("Script example")
        pin = pattern.Pins.Add((ecu_name, pin_name))
        pin.SetFailureClass(class_id)
        chosen = pin.AdjustedFailureClass
        assert chosen is not None
        print(f"pin {pin.Name} of {pin.EcuName}: class {chosen.ID} ({chosen.Name})")

        with system.connected(), pattern.activated():
            if not pin.IsActivated():
                raise RuntimeError(f"pin {pin.Name} of {pin.EcuName} is not activated")
            relays["activated"] = faultbox.sim_relays(system)  # extension
            print("activated; relays:", "; ".join(relays["activated"]) or "(real hardware)")
            # ... the test on the bench runs here ...
        print("deactivated; pin activated:", pin.IsActivated())
        relays["deactivated"] = faultbox.sim_relays(system)
    return relays


def main() -> int:
    parser = argparse.ArgumentParser(description=(__doc__ or "").splitlines()[0])
    parser.add_argument("document", help="the bench's document (.fsa or .fss)")
    parser.add_argument("ecu", help="the pin's ECU")
    parser.add_argument("pin", help="the pin's name")
    parser.add_argument("class_id", type=int, help="the failure class to insert")
    parser.add_argument(
        "--hardware", choices=["sim", "config"], default="config",
        help="config: the settings' CAN channel and serial port tables (default); sim: the built-in simulator",
    )
    args = parser.parse_args()

    # The component's messages (message number and text) come through logging.
    logging.basicConfig(level=logging.INFO, format="%(levelname)s %(name)s %(message)s")
    try:
        run(args.document, args.ecu, args.pin, args.class_id, args.hardware)
    except faultbox.FaultboxError as error:
        print(f"failed: {error}")
        for message in error.messages:
            print(f"  {message}")
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main())
