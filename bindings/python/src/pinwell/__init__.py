"""Judges software with a Pinwell ticket, and checks its bytes against its signature.

    import pinwell

    with pinwell.Roots.from_directory("/etc/pinwell/platform") as roots:
        result = pinwell.verify("Sample.app", roots)
        if result.is_good:
            ...
        print(result.reason)

Four functions, which all work without a network:

judge()        the verdict of `pinwell validate` before it contacts the record service
verify()       the same, with a check of every byte: the verdict of `pinwell-gate --offline`
find_ticket()  the ticket that is attached to an artefact, and its place
record_name()  the name of the record with an artefact's ticket

Paths are the same as for open(): text, bytes, or objects with __fspath__. A fault of an artefact is not an exception of
judge() and verify(), but their verdict. Texts from an artefact may have any character. Bytes that are not UTF-8 become
lone surrogates (see os.fsdecode()): print them with ascii() or repr().

All functions may be called from several threads at once; they release the interpreter's lock.
"""

from ._api import find_ticket, judge, record_name, record_name_for_hash, verify
from ._errors import (
    Error,
    MalformedError,
    NoCertificatesError,
    NotSignedError,
    UnreadableError,
    UnsupportedError,
)
from ._roots import Roots
from ._values import Check, FoundTicket, Kind, Outcome, Result, Verdict

__all__ = [
    "Check",
    "Error",
    "FoundTicket",
    "Kind",
    "MalformedError",
    "NoCertificatesError",
    "NotSignedError",
    "Outcome",
    "Result",
    "Roots",
    "UnreadableError",
    "UnsupportedError",
    "Verdict",
    "find_ticket",
    "judge",
    "record_name",
    "record_name_for_hash",
    "verify",
]
