"""The artefacts of the test vectors, made once."""

from __future__ import annotations

import json
import pathlib
import sys
from collections.abc import Iterator

import pytest

import pinwell

VECTORS = pathlib.Path(__file__).resolve().parents[3] / "tests" / "vectors"
sys.path.insert(0, str(VECTORS))
sys.dont_write_bytecode = True

import make_artefacts  # noqa: E402

ALL = json.loads((VECTORS / "vectors.json").read_text())["vectors"]


class Artefacts:
    """The paths of the vectors' artefacts, by the vectors' names."""

    def __init__(self, folder: pathlib.Path) -> None:
        self.paths = {
            vector["name"]: make_artefacts.make(vector, folder / str(number))
            for number, vector in enumerate(ALL)
        }

    def __getitem__(self, name: str) -> pathlib.Path:
        return self.paths[name]


@pytest.fixture(scope="session")
def artefacts(tmp_path_factory: pytest.TempPathFactory) -> Artefacts:
    return Artefacts(tmp_path_factory.mktemp("vectors"))


@pytest.fixture()
def roots() -> Iterator[pinwell.Roots]:
    with pinwell.Roots.from_directory(VECTORS / "platform") as opened:
        yield opened


@pytest.fixture()
def application(artefacts: Artefacts) -> pathlib.Path:
    return artefacts["an application with its ticket"]


@pytest.fixture()
def image(artefacts: Artefacts) -> pathlib.Path:
    return artefacts["a signed disk image with its ticket"]
