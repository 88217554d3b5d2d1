"""Builds the package. The fixed settings are in pyproject.toml."""

import pathlib
import re

from setuptools import setup

TOP = pathlib.Path(__file__).resolve().parents[2]


def version() -> str:
    """The version of the programs, which is the package's too."""
    found = re.search(r"project\(pinwell VERSION ([0-9.]+)", (TOP / "CMakeLists.txt").read_text(encoding="utf-8"))
    if found is None:
        raise RuntimeError("CMakeLists.txt states no version")
    return found[1]


setup(version=version(), cffi_modules=["build_ffi.py:ffi"])
