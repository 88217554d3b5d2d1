"""The trusted certificates."""

from __future__ import annotations

import weakref
from types import TracebackType
from typing import Any

from ._errors import check, new_error
from ._ffi import ffi
from ._library import PathLike, lib, path_bytes, text


class Roots:
    """The certificates at which a ticket's chain may end. Immutable; for any number of threads.

    A context manager. Closing is optional: the object's end frees everything.
    """

    def __init__(self, handle: Any) -> None:
        """For this package; use from_directory() or from_certificates()."""
        self._handle = handle
        self._close = weakref.finalize(self, lib.pinwell_roots_free, handle)

    @classmethod
    def from_directory(cls, path: PathLike) -> Roots:
        """The trust of pinwell(1) if $PINWELL_PLATFORM names this directory: its roots/ and user-trust/deny/.

        Reads the directory once, now. An unreadable file is ignored, and a missing directory counts as empty: see
        len() and problems.
        """
        raw = path_bytes(path)
        place, error = ffi.new("pinwell_roots **"), new_error()
        check(lib.pinwell_roots_from_directory(raw, len(raw), place, error), error)
        return cls(place[0])

    @classmethod
    def from_certificates(cls, certificates: bytes) -> Roots:
        """The certificates of a PEM text, or one certificate in DER. Otherwise raises NoCertificatesError."""
        place, error = ffi.new("pinwell_roots **"), new_error()
        raw = bytes(certificates)
        check(lib.pinwell_roots_from_certificates(raw, len(raw), place, error), error)
        return cls(place[0])

    def __len__(self) -> int:
        """The number of certificates. Without any, no ticket is genuine."""
        return int(lib.pinwell_roots_count(self._handle))

    @property
    def problems(self) -> tuple[str, ...]:
        """A line for each ignored file of the directory."""
        lines = []
        length = ffi.new("size_t *")
        for index in range(lib.pinwell_roots_problem_count(self._handle)):
            lines.append(text(lib.pinwell_roots_problem(self._handle, index, length), length[0]))
        return tuple(lines)

    def close(self) -> None:
        """Frees the certificates. Judging by them afterwards raises ValueError. May be called again."""
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
