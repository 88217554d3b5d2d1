"""Errors beside a verdict."""

from __future__ import annotations

import os
from typing import Any

from ._ffi import ffi
from ._library import PathLike, lib


class Error(Exception):
    """A call failed. The text gives the reason in one line."""


class UnreadableError(Error):
    """The file cannot be read, and the system gives no errno; with an errno, OSError is raised instead."""


class UnsupportedError(Error):
    """The file is of no kind that can have a ticket."""


class MalformedError(Error):
    """The file breaks a rule of its format."""

    def __init__(self, message: str, offset: int) -> None:
        super().__init__(message)
        #: The offset of the part that breaks the rule, in bytes.
        self.offset = offset


class NotSignedError(Error):
    """The artefact has no valid signature, so it has no hash and no record."""


class NoCertificatesError(Error):
    """The given roots are not certificates."""


def new_error() -> Any:
    """A structure for the library to fill in."""
    error = ffi.new("pinwell_error *")
    error.struct_size = ffi.sizeof("pinwell_error")
    return error


def check(status: int, error: Any = None, path: PathLike | None = None) -> None:
    """Raises the exception of a status, unless it is PINWELL_OK."""
    if status == lib.PINWELL_OK:
        return
    message = ffi.string(error.message if error is not None else lib.pinwell_error_text(status))
    raise _exception(status, message.decode("utf-8", "replace"), error, path)


def _exception(status: int, message: str, error: Any, path: PathLike | None) -> Exception:
    if status == lib.PINWELL_ERROR_UNREADABLE and error is not None and error.system_error != 0:
        # Like open(): FileNotFoundError, PermissionError and so on.
        number = error.system_error
        return OSError(number, os.strerror(number), path)
    if status == lib.PINWELL_ERROR_MALFORMED:
        return MalformedError(message, error.offset if error is not None else 0)
    if status == lib.PINWELL_ERROR_MEMORY:
        return MemoryError(message)
    if status in (lib.PINWELL_ERROR_ARGUMENT, lib.PINWELL_ERROR_HANDLE):
        return ValueError(message)
    kinds: dict[int, type[Error]] = {
        lib.PINWELL_ERROR_UNREADABLE: UnreadableError,
        lib.PINWELL_ERROR_UNSUPPORTED: UnsupportedError,
        lib.PINWELL_ERROR_NOT_SIGNED: NotSignedError,
        lib.PINWELL_ERROR_NO_CERTIFICATES: NoCertificatesError,
    }
    return kinds.get(status, Error)(message)


