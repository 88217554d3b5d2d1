"""The four functions."""

from __future__ import annotations

from datetime import datetime
from typing import Any

from ._errors import check, new_error
from ._ffi import ffi
from ._library import PathLike, bytes_of, lib, path_bytes, text, text_of
from ._roots import Roots
from ._values import Check, FoundTicket, Kind, Outcome, Result, Verdict, word

_NOW = -(2**63)
_RECORD_NAME_SIZE = 144


def judge(path: PathLike, roots: Roots, *, evaluation_time: datetime | None = None) -> Result:
    """Judges the attached ticket of an artefact, like `pinwell validate` before it contacts the service.

    The verdict is about the hash that the artefact's signature states, not about each byte: see verify().

    `evaluation_time` (default: now) is only for a policy that uses it; the library's own policy does not.
    Raises ValueError for a path with a zero byte, and for roots that were closed.
    """
    return _assess(lib.pinwell_judge_file, path, roots, evaluation_time, 0)


def verify(
    path: PathLike, roots: Roots, *, evaluation_time: datetime | None = None, threads: int = 0
) -> Result:
    """Judges the ticket, and checks every byte against the signature, like `pinwell-gate --offline`.

    Every byte is read once, by `threads` threads (default: one for each processor). Otherwise like judge().
    """
    return _assess(lib.pinwell_verify_file, path, roots, evaluation_time, threads)


def find_ticket(path: PathLike) -> FoundTicket | None:
    """Finds the attached ticket of an artefact; returns None if there is none.

    Raises OSError, UnsupportedError or MalformedError if the artefact cannot be read.
    """
    raw = path_bytes(path)
    place, error = ffi.new("pinwell_ticket **"), new_error()
    status = lib.pinwell_find_ticket(raw, len(raw), place, error)
    if status == lib.PINWELL_ERROR_NO_TICKET:
        return None
    check(status, error, path)
    try:
        return FoundTicket(
            data=bytes_of(lib.pinwell_ticket_bytes, place[0]) or b"",
            file=text_of(lib.pinwell_ticket_file, place[0]),
            offset=lib.pinwell_ticket_offset(place[0]),
        )
    finally:
        lib.pinwell_ticket_free(place[0])


def record_name(path: PathLike) -> str:
    """The name of the record with an artefact's ticket, such as "2/2/" and 40 hexadecimal digits.

    Raises NotSignedError without a valid signature; OSError or UnsupportedError if the artefact cannot be read.
    """
    raw = path_bytes(path)
    buffer, error = ffi.new("char[]", _RECORD_NAME_SIZE), new_error()
    check(lib.pinwell_record_name_of_file(raw, len(raw), buffer, len(buffer), ffi.NULL, error), error, path)
    return ffi.string(buffer).decode("ascii")  # type: ignore[no-any-return]


def record_name_for_hash(digest_type: int, code_hash: bytes) -> str:
    """The name of the record with the ticket for a hash. Raises ValueError if no hash has this length."""
    raw = bytes(code_hash)
    if not 0 <= digest_type < 2**32:
        raise ValueError("no digest type has this number")
    buffer, error = ffi.new("char[]", _RECORD_NAME_SIZE), new_error()
    check(lib.pinwell_record_name(digest_type, raw, len(raw), buffer, len(buffer), ffi.NULL, error), error)
    return ffi.string(buffer).decode("ascii")  # type: ignore[no-any-return]


def _assess(function: Any, path: PathLike, roots: Roots, time: datetime | None, threads: int) -> Result:
    if not 0 <= threads < 2**32:
        raise ValueError("there are too many threads, or too few")
    raw = path_bytes(path)
    options = ffi.new("pinwell_options *")
    options.struct_size = ffi.sizeof("pinwell_options")
    options.evaluation_time = _NOW if time is None else int(time.timestamp())
    options.threads = threads
    place, error = ffi.new("pinwell_result **"), new_error()
    check(function(raw, len(raw), roots._handle, options, place, error), error, path)
    try:
        return _result(place[0])
    finally:
        lib.pinwell_result_free(place[0])


def _result(handle: Any) -> Result:
    kind = ffi.string(lib.pinwell_kind_text(lib.pinwell_result_kind(handle))).decode("ascii")
    verdict = ffi.string(lib.pinwell_verdict_text(lib.pinwell_result_verdict(handle))).decode("ascii")
    return Result(
        kind=word(Kind, kind),
        verdict=word(Verdict, verdict),
        exit_status=lib.pinwell_result_exit_status(handle),
        reason=text_of(lib.pinwell_result_reason, handle),
        record_name=text_of(lib.pinwell_result_record_name, handle) or None,
        code_hash=bytes_of(lib.pinwell_result_code_hash, handle),
        digest_type=lib.pinwell_result_digest_type(handle),
        ticket=bytes_of(lib.pinwell_result_ticket, handle),
        checks=tuple(_checks(handle)),
    )


def _checks(handle: Any) -> list[Check]:
    one = ffi.new("pinwell_check *")
    one.struct_size = ffi.sizeof("pinwell_check")
    checks = []
    for index in range(lib.pinwell_result_check_count(handle)):
        check(lib.pinwell_result_check(handle, index, one))
        outcome = ffi.string(lib.pinwell_outcome_text(one.outcome)).decode("ascii")
        checks.append(
            Check(
                name=text(one.name, one.name_length),
                place=text(one.place, one.place_length),
                outcome=word(Outcome, outcome),
                expected=text(one.expected, one.expected_length),
                found=text(one.found, one.found_length),
                depth=one.depth,
            )
        )
    return checks
