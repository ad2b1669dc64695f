"""Failure insertion on HIL test benches from Python.

faultbox.FaultInjection() gives the root object of the automation object
model: Systems -> System -> FailurePatterns -> pattern -> Pins, and
FailureClasses. Every member keeps the model's name; collections are also
Python sequences, systems and patterns work with ``with``, and failures
raise FaultboxError or one of its families. docs/python.md is the guide.
"""

from ._faultbox import *  # noqa: F401,F403 - the model's classes, enumerations and constants
from ._faultbox import (
    AutomationObject as AutomationObject,
    _BaseFailurePattern as _BaseFailurePattern,
    _BaseFailurePatternPin as _BaseFailurePatternPin,
    _FaultInjection as _FaultInjection,
    __version__ as __version__,
    _set_failure_factory,
    _started as _started,
)
from ._errors import (
    FaultboxError as FaultboxError,
    FileError as FileError,
    HardwareTimeoutError as HardwareTimeoutError,
    InterlockError as InterlockError,
    Message as Message,
    NotConnectedError as NotConnectedError,
    NotFoundError as NotFoundError,
    make_failure as _make_failure,
)
from ._idioms import install as _install_idioms
from ._idioms import switch_off as switch_off

_set_failure_factory(_make_failure)
_install_idioms()
