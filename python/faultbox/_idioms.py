"""What Python scripts expect of the model's objects beyond the model's own
members: collections as sequences with look-up by name, ``with`` blocks that
leave the bench switched off, and reprs that say what an object is.

The compiled classes get these members when the package is imported."""

from __future__ import annotations

import contextlib
import operator
from typing import Any, Callable, Iterator, List, Optional, Sequence

from . import _faultbox as _model
from ._errors import FaultboxError, NotFoundError

_INVALID = _model.FaultboxErrors.E_FAULTBOX_INVALID_PARAMETER
# Next() with this count gives every element from the current position.
_EVERY = 0xFFFFFFFF


# ---- collections ----------------------------------------------------------


def _snapshot(collection: Any) -> List[Any]:
    elements: List[Any] = collection._NewEnum.Next(_EVERY)
    return elements


def _is_pin_key(collection: Any, key: object) -> bool:
    return isinstance(collection, _model.FailurePatternPins) and isinstance(key, tuple)


def _look_up(collection: Any, key: Any) -> Any:
    """Item for the given key; a key that selects nothing raises NotFoundError."""
    try:
        if _is_pin_key(collection, key):
            if len(key) != 2 or not all(isinstance(part, str) for part in key):
                raise TypeError("a pin is looked up as (ECU, PIN), two texts")
            ecu, pin = key
            return collection.Item(pin, ecu)
        return collection.Item(key)
    except FaultboxError as error:
        if error.code is not _INVALID:
            raise
        raise NotFoundError(error.hresult, error.description, error.messages) from None


def _len(self: Any) -> int:
    """len(): the number of elements (Count)."""
    count: int = self.Count
    return count


def _iter(self: Any) -> Iterator[Any]:
    """Iterates over a snapshot taken when the loop starts, so that closing or
    removing elements inside the loop visits every one. _NewEnum walks the
    live collection instead."""
    return iter(_snapshot(self))


def _getitem(self: Any, key: Any) -> Any:
    """collection[key]: by position (negative counts from the end), by name,
    for pins also by (ECU, PIN); a slice gives a list. A key that selects
    nothing raises NotFoundError (an IndexError and a KeyError too)."""
    if isinstance(key, slice):
        return _snapshot(self)[key]
    if isinstance(key, (str, tuple)):
        if isinstance(key, tuple) and not isinstance(self, _model.FailurePatternPins):
            raise TypeError("only pins are looked up by (ECU, PIN)")
        return _look_up(self, key)
    if isinstance(key, bool):
        raise TypeError("a position is an int, not a bool")
    position = operator.index(key)
    if position < 0:
        position += len(self)
    return _look_up(self, position)


def _contains(self: Any, key: object) -> bool:
    """``x in collection``: an element of it, a name, or for pins (ECU, PIN)."""
    if isinstance(key, _model.AutomationObject):
        return any(element is key for element in _snapshot(self))
    if isinstance(key, str) or _is_pin_key(self, key):
        try:
            _look_up(self, key)
        except (NotFoundError, TypeError):
            return False
        return True
    return False


# ---- switching off ---------------------------------------------------------


def switch_off(system: _model.System) -> Optional[str]:
    """Makes sure no pattern of `system` stays activated: deactivates the
    activated one and, when that fails, resets the hardware (every relay
    off). Answers the name of the pattern that was activated, or None.
    A failed deactivation is raised once the reset has run."""
    pattern = system.FailurePatterns.ActivatedFailurePattern
    if pattern is None:
        return None
    name = pattern.Name
    _deactivate(pattern, system)
    return name


def _deactivate(pattern: _model._BaseFailurePattern, system: _model.System) -> None:
    """Deactivates `pattern` of `system` when it is activated, resetting the
    hardware when that fails."""
    if not pattern.IsActivated():
        return
    try:
        pattern.Deactivate()
    except BaseException:
        # A reset is the one way left to switch every relay off; a Ctrl-C
        # while deactivating gets there too.
        if system.IsConnected():
            system.ResetHardware()
        raise
    if pattern.IsActivated() and system.IsConnected():
        system.ResetHardware()


def _finish(steps: Sequence[Callable[[], object]], pending: Optional[BaseException]) -> None:
    """Runs every step, also after one failed. The first failure is raised;
    while the with-block raises `pending`, the failures become its notes."""
    first: Optional[BaseException] = None
    for step in steps:
        try:
            step()
        except BaseException as error:  # noqa: B902 - every step must get its turn
            if pending is not None:
                pending.add_note("faultbox, while leaving the with-block: %s: %s" % (type(error).__name__, error))
            elif first is None:
                first = error
    if first is not None:
        raise first


def _leave(system: Any, pending: Optional[BaseException], close: bool) -> None:
    if not system._attached:
        return
    steps: List[Callable[[], object]] = [lambda: switch_off(system)]
    steps.append(lambda: system.IsConnected() and system.Disconnect())
    if close:
        steps.append(system.Close)
    _finish(steps, pending)


def _enter_system(self: Any) -> Any:
    """``with system:`` gives the system itself."""
    return self


def _exit_system(self: Any, kind: object, error: Optional[BaseException], traceback: object) -> bool:
    """Closes the system at the block's end: its activated pattern is
    deactivated (the hardware reset when that fails) and the system
    disconnected first. An error of the block is raised again."""
    _leave(self, error, close=True)
    return False


@contextlib.contextmanager
def _connected(self: Any) -> Iterator[Any]:
    """``with system.connected():`` connects the system (unless it is
    connected already) and disconnects it at the block's end, after
    deactivating its activated pattern (resetting the hardware when that
    fails). An error of the block, Ctrl-C too, is raised again."""
    if not self.IsConnected():
        self.Connect()
    try:
        yield self
    except BaseException as error:
        _leave(self, error, close=False)
        raise
    _leave(self, None, close=False)


@contextlib.contextmanager
def _activated(self: Any, Pins: Optional[Sequence[Any]] = None) -> Iterator[Any]:
    """``with pattern.activated(Pins=None):`` activates the pattern (every
    pin, or the pins listed) and deactivates it at the block's end, also on
    an error or Ctrl-C, which is raised again; a failed deactivation resets
    the hardware."""
    system = self._system
    steps = [lambda: _deactivate(self, system)]
    try:
        self.Activate(Pins)
    except BaseException as error:
        # A time-out or Ctrl-C may leave part of the pattern on.
        _finish(steps, error)
        raise
    try:
        yield self
    except BaseException as error:
        _finish(steps, error)
        raise
    _finish(steps, None)


# ---- reprs -----------------------------------------------------------------


def _count(number: int, what: str, plural: str = "") -> str:
    return "%d %s" % (number, what if number == 1 else plural or what + "s")


def _state(activated: bool) -> str:
    return "activated" if activated else "not activated"


def _describe_root(root: Any) -> str:
    return "%r (%s)" % (root.Name, _count(len(root.Systems), "system"))


def _describe_system(system: Any) -> str:
    platform = system.PlatformType.name[3:-8]  # fptKR60Platform -> KR60
    return "%r (%s, %s)" % (system.Name, platform, "connected" if system.IsConnected() else "not connected")


def _describe_patterns(patterns: Any) -> str:
    active = patterns.ActivatedFailurePattern
    return "(%s%s)" % (_count(len(patterns), "pattern"), ", %r activated" % active.Name if active else "")


def _describe_pattern(pattern: Any) -> str:
    return "%r (%s, %s)" % (pattern.Name, _count(len(pattern.Pins), "pin"), _state(pattern.IsActivated()))


def _describe_pin(pin: Any) -> str:
    failure_class, relay_vector = pin.AdjustedFailureClassID
    chosen = "class %d/%d" % (failure_class, relay_vector) if failure_class else "no failure class"
    return "%r (%s, %s)" % ((pin.EcuName, pin.Name), chosen, _state(pin.IsActivated()))


def _describe_classes(classes: Any) -> str:
    return "(%s, version %r)" % (_count(len(classes), "class", "classes"), classes.Version)


def _describe_class(failure_class: Any) -> str:
    return "%d %r" % (failure_class.ID, failure_class.Name)


def _repr_with(describe: Optional[Callable[[Any], str]]) -> Callable[[Any], str]:
    def __repr__(self: Any) -> str:
        kind = "faultbox." + type(self).__name__
        if describe is None:
            return "<%s>" % kind
        if getattr(self, "_attached", True):
            try:
                return "<%s %s>" % (kind, describe(self))
            except FaultboxError:
                pass
        return "<%s (no longer exists)>" % kind

    return __repr__


def install() -> None:
    """Adds the members above to the compiled classes."""
    for collection in (_model.Systems, _model.FailurePatterns, _model.FailurePatternPins, _model.FailureClasses):
        for name, member in (
            ("__len__", _len),
            ("__iter__", _iter),
            ("__getitem__", _getitem),
            ("__contains__", _contains),
        ):
            setattr(collection, name, member)
    setattr(_model.System, "__enter__", _enter_system)
    setattr(_model.System, "__exit__", _exit_system)
    setattr(_model.System, "connected", _connected)
    setattr(_model._BaseFailurePattern, "activated", _activated)
    for cls, describe in (
        (_model._FaultInjection, _describe_root),
        (_model.Systems, lambda systems: "(%s)" % _count(len(systems), "system")),
        (_model.System, _describe_system),
        (_model.FailurePatterns, _describe_patterns),
        (_model._BaseFailurePattern, _describe_pattern),
        (_model.FailurePatternPins, lambda pins: "(%s)" % _count(len(pins), "pin")),
        (_model._BaseFailurePatternPin, _describe_pin),
        (_model.FailureClasses, _describe_classes),
        (_model.FailureClass, _describe_class),
        (_model.Enumerator, None),
    ):
        setattr(cls, "__repr__", _repr_with(describe))
