"""Judges software that carries a Pinwell ticket, and holds its bytes against what was signed.

    import pinwell

    with pinwell.Roots.from_directory("/etc/pinwell/platform") as roots:
        result = pinwell.verify("Sample.app", roots)
        if result.is_good:
            ...
        print(result.reason)

Four questions, all of them answered on this machine alone:

judge()        what `pinwell validate` says before it asks the record service
verify()       that, and whether every byte still is what was signed: what `pinwell-gate --offline` says
find_ticket()  the ticket that is attached to an artefact, and its place
record_name()  the name of the record that holds an artefact's ticket

Paths are those of open(): text, bytes, or objects with __fspath__. What is wrong with an artefact is no exception of
judge() and verify(): it is their verdict. Texts that come from an artefact may hold any character, and bytes that are
not UTF-8 as lone surrogates (see os.fsdecode()): show them with ascii() or repr().

Everything may be called from several threads at once; the interpreter's lock is not held meanwhile.
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
