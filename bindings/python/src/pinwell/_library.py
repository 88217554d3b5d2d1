"""The shared library, and its texts and bytes as Python objects."""

from __future__ import annotations

import os
from typing import Any, Union

from ._ffi import ffi

LIBRARY = "libpinwell-ticket.so.1"
OLDEST = 1000  # interface 1.0, the first with this name

PathLike = Union[str, bytes, "os.PathLike[str]", "os.PathLike[bytes]"]


def _load() -> Any:
    library = ffi.dlopen(LIBRARY)
    try:
        version = library.pinwell_version()
    except AttributeError:
        version = 0
    if version < OLDEST:
        raise ImportError(f"{LIBRARY} is too old: the interface has to be 1.0 or later")
    return library


lib: Any = _load()


def path_bytes(path: PathLike) -> bytes:
    """A path in the system's bytes."""
    return os.fsencode(path)


def text(pointer: Any, length: int) -> str:
    """A text from the library, with any bytes."""
    return "" if pointer == ffi.NULL else os.fsdecode(bytes(ffi.buffer(pointer, length)))


def text_of(function: Any, handle: Any) -> str:
    """The result of a function as a text."""
    length = ffi.new("size_t *")
    return text(function(handle, length), length[0])


def bytes_of(function: Any, handle: Any) -> bytes | None:
    """The result of a function as bytes."""
    length = ffi.new("size_t *")
    pointer = function(handle, length)
    return None if pointer == ffi.NULL else bytes(ffi.buffer(pointer, length[0]))
