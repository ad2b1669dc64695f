"""FaultboxError and the families of failures a script handles differently.

The compiled part raises what make_failure builds, so that a script can
catch a time-out apart from a refusal without comparing codes."""

from __future__ import annotations

import logging
from typing import Dict, NamedTuple, Optional, Sequence, Tuple, Type, Union

from ._faultbox import FaultboxErrors

_LEVELS = {3: logging.ERROR, 2: logging.WARNING, 1: logging.INFO, 0: logging.DEBUG}


class Message(NamedTuple):
    """A numbered message the component reported during a call: its
    `number` (docs/messages.md lists them), its logging `level` (ERROR,
    WARNING, INFO or DEBUG) and its `text` with the inserted texts put in."""

    number: int
    level: int
    text: str

    def __str__(self) -> str:
        return "%d: %s" % (self.number, self.text)


class FaultboxError(Exception):
    """A member of the object model failed.

    ``hresult`` is the member's result code (a ``FaultboxErrors`` member when
    the code is one of them), ``code`` the ``FaultboxErrors`` member or None
    for a code outside the enumeration, ``description`` says why the member
    failed, and ``messages`` holds the numbered messages the component
    reported during the call, oldest first.
    """

    def __init__(self, hresult: int, description: str = "", messages: Sequence[Message] = ()) -> None:
        code: Optional[FaultboxErrors]
        try:
            code = FaultboxErrors(hresult)
        except ValueError:
            code = None
        super().__init__(code if code is not None else hresult, description)
        self.hresult: Union[FaultboxErrors, int] = code if code is not None else hresult
        self.code = code
        self.description = description
        self.messages: Tuple[Message, ...] = tuple(messages)

    def __str__(self) -> str:
        number = "0x%08X" % int(self.hresult)
        where = "%s, %s" % (self.code.name, number) if self.code is not None else number
        return "%s (%s)" % (self.description, where) if self.description else where


class HardwareTimeoutError(FaultboxError):
    """The hardware did not answer in time, or answered something else."""


class NotConnectedError(FaultboxError):
    """The system is not connected to its hardware."""


class InterlockError(FaultboxError):
    """Refused for the bench's safety: no failure class the interlock allows,
    another pattern of the system activated, or another system on the same
    HIL simulator."""


class FileError(FaultboxError):
    """A document or pin file is missing, unreadable or inconsistent."""


class NotFoundError(FaultboxError, IndexError, KeyError):
    """``collection[key]`` selects nothing; also an IndexError and a KeyError,
    as Python's own sequences and mappings raise."""


for _family in (FaultboxError, HardwareTimeoutError, NotConnectedError, InterlockError, FileError, NotFoundError):
    _family.__module__ = "faultbox"

_E = FaultboxErrors
_FAMILY_OF_CODE: Dict[int, Type[FaultboxError]] = {
    _E.E_FAULTBOX_TIME_OUT: HardwareTimeoutError,
    _E.E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING: HardwareTimeoutError,
    _E.E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE: NotConnectedError,
    _E.E_FAULTBOX_OTHER_SYSTEM_FOR_SAME_HIL_IS_ACTIVATED: InterlockError,
    _E.E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED: InterlockError,
    _E.E_FAULTBOX_CANN_NOT_OPEN_FILE: FileError,
    _E.E_FAULTBOX_FILE_IS_NOT_OPENED: FileError,
    _E.E_FAULTBOX_TAG_NOT_FOUND: FileError,
    _E.E_FAULTBOX_HEADER_COL_NOT_FOUND: FileError,
    _E.E_FAULTBOX_CONSISTENCY_CHECK: FileError,
}
# Refusals that share the general code E_FAULTBOX are told apart by the
# message the component reported: 97 another pattern of the system is
# activated, 129 the interlock refuses the failure class for the pin.
_FAMILY_OF_MESSAGE = {97: InterlockError, 129: InterlockError}


def make_failure(hresult: int, description: str, reported: Sequence[Tuple[int, int, str]]) -> FaultboxError:
    """The exception for a failed call: its family from the code, else from
    the messages the call reported."""
    messages = [Message(number, _LEVELS.get(level, logging.DEBUG), text) for number, level, text in reported]
    family = _FAMILY_OF_CODE.get(hresult, FaultboxError)
    if family is FaultboxError:
        for message in messages:
            family = _FAMILY_OF_MESSAGE.get(message.number, family)
    return family(hresult, description, messages)
