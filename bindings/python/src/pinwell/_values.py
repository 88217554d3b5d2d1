"""What is found out about an artefact."""

from __future__ import annotations

import enum
from dataclasses import dataclass
from typing import TypeVar


class Kind(enum.Enum):
    """What an artefact is."""

    NONE = "none"  #: it cannot be read, or is of no kind that carries a ticket
    BUNDLE = "bundle"
    EXECUTABLE = "executable"  #: outside a bundle; it has no place for a ticket
    DISK_IMAGE = "diskImage"
    PACKAGE = "package"


class Verdict(enum.Enum):
    """What is said of an artefact. Only GOOD is good."""

    NONE = "none"  #: one that this package does not know, which is a refusal
    GOOD = "good"
    UNREADABLE = "unreadable"  #: it cannot be read, is of no supported kind, or has no valid signature
    NO_TICKET = "noTicket"
    REFUSED = "refused"  #: the ticket is not genuine, or does not list the artefact
    ALTERED = "altered"  #: something is not as it was signed; from verify() only
    REVOKED = "revoked"  #: the software must not run


class Outcome(enum.Enum):
    """How a check ended."""

    NONE = "none"  #: one that this package does not know, which counts as failed
    PASSED = "passed"
    SKIPPED = "skipped"  #: not looked at; `found` says why
    NOTED = "noted"  #: worth knowing, and no fault
    UNREADABLE = "unreadable"  #: the bytes cannot be read, so nothing is known of them
    FAILED = "failed"


@dataclass(frozen=True)
class Check:
    """One question that was asked about an artefact."""

    name: str  #: what was asked, such as "page-hashes"; pinwell-gate(1) has them all
    place: str  #: where in the artefact: a path, a slice, a page, a range of bytes; empty for the whole
    outcome: Outcome
    expected: str  #: what the signature states; may be empty
    found: str  #: what the bytes are; may be empty
    depth: int  #: of the part that it is about: 0 for the whole, 1 for its bytes, 2 for nested code and so on

    @property
    def is_fault(self) -> bool:
        """Whether it speaks against the artefact."""
        return self.outcome in (Outcome.FAILED, Outcome.UNREADABLE, Outcome.NONE)


@dataclass(frozen=True)
class Result:
    """A verdict, its reason, and all that was asked on the way. True if the verdict is good."""

    kind: Kind
    verdict: Verdict
    exit_status: int  #: that the programs have for the verdict: 0, 65, 66 or 77
    reason: str  #: one line in English, for people
    record_name: str | None  #: None without a valid signature
    code_hash: bytes | None  #: that a ticket lists the artefact by; None without a valid signature
    digest_type: int  #: of that hash: 1 SHA-1, 2 and 3 SHA-256, 4 SHA-384; 0 if it is not known
    ticket: bytes | None  #: that is attached, genuine or not
    checks: tuple[Check, ...]  #: those of a part come before those of the parts in it

    @property
    def is_good(self) -> bool:
        """Whether all that was asked is as it should be."""
        return self.verdict is Verdict.GOOD

    def __bool__(self) -> bool:
        return self.is_good

    @property
    def failed(self) -> tuple[Check, ...]:
        """The checks that speak against the artefact."""
        return tuple(check for check in self.checks if check.is_fault)


@dataclass(frozen=True)
class FoundTicket:
    """A ticket, and where it is. Whether it is genuine was not asked."""

    data: bytes
    file: str  #: the absolute path of the file that it is in: of a bundle, Contents/CodeResources
    offset: int  #: where in that file it begins


Word = TypeVar("Word", Kind, Verdict, Outcome)


def word(of: type[Word], text: str) -> Word:
    """The member of an enumeration that the library has this text for."""
    try:
        return of(text)
    except ValueError:
        return of("none")
