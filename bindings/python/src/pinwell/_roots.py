"""Whom to trust."""

from __future__ import annotations

import weakref
from types import TracebackType
from typing import Any

from ._errors import check, new_error
from ._ffi import ffi
from ._library import PathLike, lib, path_bytes, text


class Roots:
    """Certificates that a ticket's chain may end in. Immutable; to be used by any number of threads.

    A context manager. Closing is good manners and not necessary: nothing stays behind when the object is gone.
    """

    def __init__(self, handle: Any) -> None:
        """For this package; use from_directory() or from_certificates()."""
        self._handle = handle
        self._close = weakref.finalize(self, lib.pinwell_roots_free, handle)

    @classmethod
    def from_directory(cls, path: PathLike) -> Roots:
        """What pinwell(1) trusts if $PINWELL_PLATFORM names this directory: its roots/ and user-trust/deny/.

        Read now, once. A file that cannot be read counts for nothing, and a directory that does not exist for an empty
        one: see len() and problems.
        """
        raw = path_bytes(path)
        place, error = ffi.new("pinwell_roots **"), new_error()
        check(lib.pinwell_roots_from_directory(raw, len(raw), place, error), error)
        return cls(place[0])

    @classmethod
    def from_certificates(cls, certificates: bytes) -> Roots:
        """The certificates of a PEM text, or one certificate in DER. Raises NoCertificatesError if they are none."""
        place, error = ffi.new("pinwell_roots **"), new_error()
        raw = bytes(certificates)
        check(lib.pinwell_roots_from_certificates(raw, len(raw), place, error), error)
        return cls(place[0])

    def __len__(self) -> int:
        """How many certificates a chain may end in. Without any, no ticket is genuine."""
        return int(lib.pinwell_roots_count(self._handle))

    @property
    def problems(self) -> tuple[str, ...]:
        """A line for each file of the directory that was left out."""
        lines = []
        length = ffi.new("size_t *")
        for index in range(lib.pinwell_roots_problem_count(self._handle)):
            lines.append(text(lib.pinwell_roots_problem(self._handle, index, length), length[0]))
        return tuple(lines)

    def close(self) -> None:
        """Lets go of the certificates. Whoever judges by them afterwards gets a ValueError. May be called again."""
        self._close()

    def __enter__(self) -> Roots:
        return self

    def __exit__(
        self,
        kind: type[BaseException] | None,
        value: BaseException | None,
        traceback: TracebackType | None,
    ) -> None:
        self.close()
