"""The test vectors, which every language runs."""

from __future__ import annotations

import pytest
from conftest import ALL, Artefacts

import pinwell

#: Numbers of find_ticket's statuses in the vectors.
UNREADABLE, UNSUPPORTED, MALFORMED, NO_TICKET = 4, 5, 6, 7


def test_there_are_vectors_of_every_verdict() -> None:
    assert len(ALL) > 50
    named = {pinwell.Verdict(vector["verify"]["verdict"]) for vector in ALL}
    assert named == set(pinwell.Verdict) - {pinwell.Verdict.NONE}


@pytest.mark.parametrize("vector", ALL, ids=lambda vector: vector["name"])
class TestVector:
    def test_is_judged_as_expected(self, vector: dict, artefacts: Artefacts, roots: pinwell.Roots) -> None:
        result = pinwell.judge(artefacts[vector["name"]], roots)
        assert result.verdict.value == vector["judge"]["verdict"]
        assert result.exit_status == vector["judge"]["exitStatus"]
        assert result.kind.value == vector["kind"]
        assert result.record_name == (vector["recordName"] or None)
        assert result.reason
        assert bool(result) == (result.exit_status == 0)

    def test_is_verified_as_expected(self, vector: dict, artefacts: Artefacts, roots: pinwell.Roots) -> None:
        result = pinwell.verify(artefacts[vector["name"]], roots)
        assert result.verdict.value == vector["verify"]["verdict"]
        assert result.exit_status == vector["verify"]["exitStatus"]
        assert sorted([check.name, check.place] for check in result.failed) == vector["verify"]["failed"]

    def test_has_its_ticket_where_expected(self, vector: dict, artefacts: Artefacts) -> None:
        path, expected = artefacts[vector["name"]], vector["ticket"]
        exceptions = {
            UNREADABLE: FileNotFoundError,
            UNSUPPORTED: pinwell.UnsupportedError,
            MALFORMED: pinwell.MalformedError,
        }
        if expected["status"] in exceptions:
            with pytest.raises(exceptions[expected["status"]]):
                pinwell.find_ticket(path)
        elif expected["status"] == NO_TICKET:
            assert pinwell.find_ticket(path) is None
        else:
            found = pinwell.find_ticket(path)
            assert found is not None
            file = path / expected["file"] if expected["file"] else path
            assert (found.file, found.offset) == (str(file), expected["offset"])
            contents = file.read_bytes()
            assert found.data == contents[found.offset : found.offset + expected["length"]]
