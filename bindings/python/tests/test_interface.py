"""Wrong arguments, and the release of memory and handles."""

from __future__ import annotations

import gc
import os
import pathlib
import resource
import threading
from datetime import datetime, timezone

import pytest
from conftest import VECTORS, Artefacts

import pinwell


def test_takes_every_form_of_a_path(application: pathlib.Path, roots: pinwell.Roots) -> None:
    for path in (application, str(application), os.fsencode(application)):
        assert pinwell.verify(path, roots).is_good
        assert pinwell.record_name(path).startswith("2/2/")


@pytest.mark.parametrize("path", ["a\0b", b"a\0b", "", b""])
def test_refuses_a_path_that_is_none(path: str | bytes, roots: pinwell.Roots) -> None:
    for call in (lambda: pinwell.judge(path, roots), lambda: pinwell.verify(path, roots)):
        with pytest.raises(ValueError):
            call()
    with pytest.raises(ValueError):
        pinwell.find_ticket(path)
    with pytest.raises(ValueError):
        pinwell.record_name(path)


@pytest.mark.parametrize("path", [None, 7, object(), ["a"]])
def test_refuses_what_is_no_path(path: object, roots: pinwell.Roots) -> None:
    with pytest.raises(TypeError):
        pinwell.judge(path, roots)  # type: ignore[arg-type]


def test_has_a_verdict_for_a_name_that_is_not_utf8(tmp_path: pathlib.Path, roots: pinwell.Roots) -> None:
    name = os.fsencode(tmp_path) + b"/\xff\xfe.dmg"
    with open(name, "wb") as file:
        file.write((VECTORS / "artefacts" / "Sample.dmg").read_bytes())
    assert pinwell.verify(name, roots).is_good
    found = pinwell.find_ticket(name)
    assert found is not None and os.fsencode(found.file) == name


def test_shows_a_place_that_is_not_utf8(artefacts: Artefacts, tmp_path: pathlib.Path, roots: pinwell.Roots) -> None:
    application = tmp_path / "Sample.app"
    make = __import__("make_artefacts")
    make.make({"from": "Sample.app", "artefact": "Sample.app"}, tmp_path / "made").rename(application)
    with open(os.fsencode(application) + b"/Contents/Resources/\xff.txt", "wb"):
        pass
    result = pinwell.verify(application, roots)
    assert [os.fsencode(check.place) for check in result.failed] == [b"Contents/Resources/\xff.txt"]


def test_raises_what_open_would_raise(tmp_path: pathlib.Path) -> None:
    with pytest.raises(FileNotFoundError) as missing:
        pinwell.record_name(tmp_path / "missing.dmg")
    assert missing.value.filename == tmp_path / "missing.dmg"
    with pytest.raises(pinwell.UnsupportedError):
        pinwell.record_name(tmp_path / "..")
    (tmp_path / "short.dmg").write_bytes(b"x" * 1000)
    with pytest.raises(pinwell.MalformedError) as malformed:
        pinwell.find_ticket(tmp_path / "short.dmg")
    assert malformed.value.offset == 1000 - 512
    with pytest.raises(pinwell.NotSignedError):
        pinwell.record_name(tmp_path / "short.dmg")


def test_never_opens_what_could_block(tmp_path: pathlib.Path, roots: pinwell.Roots) -> None:
    os.mkfifo(tmp_path / "fifo.pkg")
    for path in (tmp_path / "fifo.pkg", "/dev/zero", "/dev/stdin"):
        assert pinwell.verify(path, roots).verdict is pinwell.Verdict.UNREADABLE


def test_names_the_record_of_a_hash() -> None:
    assert pinwell.record_name_for_hash(2, b"\x00\xff") == "2/2/00ff"
    assert pinwell.record_name_for_hash(0, bytearray(b"\x01")) == "1/01"
    for digest_type, code_hash in ((2, b""), (2, bytes(65)), (-1, b"x"), (2**32, b"x")):
        with pytest.raises(ValueError):
            pinwell.record_name_for_hash(digest_type, code_hash)


def test_judges_at_every_time_alike(application: pathlib.Path, roots: pinwell.Roots) -> None:
    for year in (1971, 2100):
        assert pinwell.judge(application, roots, evaluation_time=datetime(year, 1, 1, tzinfo=timezone.utc))


def test_a_result_is_true_only_if_it_is_good(artefacts: Artefacts, roots: pinwell.Roots) -> None:
    assert pinwell.verify(artefacts["an application with its ticket"], roots)
    altered = pinwell.verify(artefacts["an application with a changed page"], roots)
    assert not altered
    assert altered.verdict is pinwell.Verdict.ALTERED
    (fault,) = altered.failed
    assert fault.name == "page-hashes" and fault.expected != fault.found


def test_a_word_of_a_later_library_is_no_approval() -> None:
    from pinwell._values import word

    assert word(pinwell.Verdict, "splendid") is pinwell.Verdict.NONE
    assert pinwell.Check("a", "b", word(pinwell.Outcome, "splendid"), "", "", 0).is_fault


# Roots.


def test_trusts_nothing_without_roots(application: pathlib.Path, tmp_path: pathlib.Path) -> None:
    with pinwell.Roots.from_directory(tmp_path) as none:
        assert len(none) == 0
        assert pinwell.judge(application, none).verdict is pinwell.Verdict.REFUSED


def test_takes_roots_from_pem(application: pathlib.Path) -> None:
    pem = (VECTORS / "platform" / "roots" / "sample.pem").read_bytes()
    with pinwell.Roots.from_certificates(pem) as made:
        assert len(made) == 1 and pinwell.judge(application, made)
    for text in (b"", b"x", pem[: len(pem) // 2]):
        with pytest.raises(pinwell.NoCertificatesError):
            pinwell.Roots.from_certificates(text)
    with pytest.raises(TypeError):
        pinwell.Roots.from_certificates("text")  # type: ignore[arg-type]


def test_names_roots_that_are_left_out(tmp_path: pathlib.Path) -> None:
    (tmp_path / "roots").mkdir()
    (tmp_path / "roots" / "bad.pem").write_text("no certificate\n")
    with pinwell.Roots.from_directory(tmp_path) as some:
        assert "bad.pem" in some.problems[0]


def test_roots_that_were_closed_judge_nothing(application: pathlib.Path) -> None:
    closed = pinwell.Roots.from_directory(VECTORS / "platform")
    closed.close()
    closed.close()
    assert len(closed) == 0
    with pytest.raises(ValueError):
        pinwell.judge(application, closed)


def test_roots_may_be_closed_by_one_thread_while_another_judges(application: pathlib.Path) -> None:
    for _ in range(10):
        shared = pinwell.Roots.from_directory(VECTORS / "platform")
        seen: list[object] = []

        def judge(shared: pinwell.Roots = shared, seen: list[object] = seen) -> None:
            try:
                seen.append(pinwell.judge(application, shared).verdict)
            except ValueError:
                seen.append("closed")

        threads = [threading.Thread(target=judge) for _ in range(4)]
        for thread in threads:
            thread.start()
        shared.close()
        for thread in threads:
            thread.join()
        assert len(seen) == 4 and set(seen) <= {pinwell.Verdict.GOOD, "closed"}


# Memory and handles.


def test_leaves_no_descriptor_open(artefacts: Artefacts, roots: pinwell.Roots) -> None:
    before = len(os.listdir("/proc/self/fd"))
    for path in artefacts.paths.values():
        pinwell.verify(path, roots)
        try:
            pinwell.find_ticket(path)
        except (OSError, pinwell.Error):
            pass
    assert len(os.listdir("/proc/self/fd")) == before


def test_leaves_no_memory_behind(image: pathlib.Path) -> None:
    def rounds(count: int) -> int:
        for _ in range(count):
            pinwell.Roots.from_directory(VECTORS / "platform")
            with pinwell.Roots.from_directory(VECTORS / "platform") as some:
                pinwell.verify(image, some)
                pinwell.find_ticket(image)
        gc.collect()
        return resource.getrusage(resource.RUSAGE_SELF).ru_maxrss

    settled = rounds(100)
    # KiB, for handles of several KiB each: one of them lost a round is far more.
    assert rounds(1000) - settled < 2048
