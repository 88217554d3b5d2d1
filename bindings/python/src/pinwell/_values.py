"""The results about an artefact."""

from __future__ import annotations

import enum
from dataclasses import dataclass
from typing import TypeVar


class Kind(enum.Enum):
    """The kind of an artefact."""

    NONE = "none"  #: it cannot be read, or is of no kind that can have a ticket
    BUNDLE = "bundle"
    EXECUTABLE = "executable"  #: outside a bundle; it has no place for a ticket
    DISK_IMAGE = "diskImage"
    PACKAGE = "package"


class Verdict(enum.Enum):
    """The verdict on an artefact. Only GOOD is good."""

    NONE = "none"  #: unknown to this package; a refusal
    GOOD = "good"
    UNREADABLE = "unreadable"  #: it cannot be read, is of no supported kind, or has no valid signature
    NO_TICKET = "noTicket"
    REFUSED = "refused"  #: the ticket is not genuine, or does not list the artefact
    ALTERED = "altered"  #: changed since signing; only from verify()
    REVOKED = "revoked"  #: the software must not run


class Outcome(enum.Enum):
    """The outcome of a check."""

    NONE = "none"  #: unknown to this package; counts as failed
    PASSED = "passed"
    SKIPPED = "skipped"  #: not checked; `found` has the reason
    NOTED = "noted"  #: noteworthy, but no fault
    UNREADABLE = "unreadable"  #: the bytes cannot be read; counts as failed
    FAILED = "failed"


@dataclass(frozen=True)
class Check:
    """One check of an artefact."""

    name: str  #: the check, such as "page-hashes"; pinwell-gate(1) lists all
    place: str  #: in the artefact: a path, a slice, a page, a range of bytes; empty for the whole
    outcome: Outcome
    expected: str  #: the value in the signature; may be empty
    found: str  #: the value of the bytes; may be empty
    depth: int  #: of the checked part: 0 for the whole, 1 for its bytes, 2 for nested code and so on

    @property
    def is_fault(self) -> bool:
        """Whether the check counts as failed."""
        return self.outcome in (Outcome.FAILED, Outcome.UNREADABLE, Outcome.NONE)


@dataclass(frozen=True)
class Result:
    """A verdict, its reason, and all checks. True if the verdict is good."""

    kind: Kind
    verdict: Verdict
    exit_status: int  #: of the programs for this verdict: 0, 65, 66 or 77
    reason: str  #: one line in English, for people
    record_name: str | None  #: None without a valid signature
    code_hash: bytes | None  #: the artefact's hash in a ticket; None without a valid signature
    digest_type: int  #: of that hash: 1 SHA-1, 2 and 3 SHA-256, 4 SHA-384; 0 if unknown
    ticket: bytes | None  #: the attached ticket, genuine or not
    checks: tuple[Check, ...]  #: a part's checks come before the checks of its parts

    @property
    def is_good(self) -> bool:
        """Whether the verdict is good."""
        return self.verdict is Verdict.GOOD

    def __bool__(self) -> bool:
        return self.is_good

    @property
    def failed(self) -> tuple[Check, ...]:
        """The checks that count as failed."""
        return tuple(check for check in self.checks if check.is_fault)


@dataclass(frozen=True)
class FoundTicket:
    """A ticket, and its place. It was not judged."""

    data: bytes
    file: str  #: the absolute path of its file; in a bundle, Contents/CodeResources
    offset: int  #: its offset in that file


Word = TypeVar("Word", Kind, Verdict, Outcome)


def word(of: type[Word], text: str) -> Word:
    """The member of an enumeration with this text in the library."""
    try:
        return of(text)
    except ValueError:
        return of("none")
