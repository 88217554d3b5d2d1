#!/usr/bin/env python3
"""Makes the artefacts of the test vectors: a folder for each, from the committed ones and the changes to them.

    make_artefacts.py FOLDER

Prints the path of each vector's artefact, one a line, in the order of vectors.json. FOLDER must not exist.
"""

import json
import os
import pathlib
import shutil
import sys

HERE = pathlib.Path(__file__).resolve().parent


def overwrite(path, at, new):
    """Puts bytes in the place of as many others; from the end if `at` is negative."""
    contents = bytearray(path.read_bytes())
    at = at if at >= 0 else len(contents) + at
    if at + len(new) > len(contents):
        raise ValueError(f"{path}: nothing to change at {at}")
    contents[at : at + len(new)] = new
    path.write_bytes(contents)


def change(artefact, one):
    """Makes one change to an artefact. Exactly one of the keys below says what."""
    path = artefact / one["file"] if one["file"] else artefact
    if "xor" in one:
        at = one["at"]
        overwrite(path, at, bytes([path.read_bytes()[at] ^ one["xor"]]))
    elif "from" in one:
        new = (HERE / one["from"]).read_bytes()
        if "at" in one:
            overwrite(path, one["at"], new)
        else:
            path.write_bytes(new)
    elif "write" in one:
        path.write_text(one["write"])
    elif "append" in one:
        with path.open("ab") as file:
            file.write(bytes.fromhex(one["append"]))
    elif "truncate" in one:
        os.truncate(path, one["truncate"])
    elif "link" in one:
        path.unlink(missing_ok=True)
        path.symlink_to(one["link"])
    elif "rename" in one:
        path.rename(artefact / one["rename"])
    elif one.get("remove"):
        shutil.rmtree(path) if path.is_dir() and not path.is_symlink() else path.unlink()
    else:
        raise ValueError(f"no change of this kind: {one}")


def make(vector, folder):
    """Makes the artefact of one vector in a folder of its own, and returns its path."""
    folder.mkdir(parents=True)
    source = HERE / "artefacts" / vector["from"] if vector["from"] else None
    artefact = folder / vector["artefact"]
    if source is not None and source.is_dir():
        shutil.copytree(source, artefact, symlinks=True)
    elif source is not None:
        shutil.copy(source, artefact)
    for one in vector.get("changes", []):
        change(artefact, one)
    return artefact


def main():
    if len(sys.argv) != 2:
        print("usage: make_artefacts.py FOLDER", file=sys.stderr)
        return 64
    vectors = json.loads((HERE / "vectors.json").read_text())["vectors"]
    for number, vector in enumerate(vectors):
        print(make(vector, pathlib.Path(sys.argv[1]) / str(number)))
    return 0


if __name__ == "__main__":
    sys.exit(main())
