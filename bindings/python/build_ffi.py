"""Takes the declarations of the C interface from its header, for CFFI in ABI mode.

ABI mode: the package is plain Python, one wheel for every version of the interpreter and every machine, and needs
neither a compiler nor the library for a build. This is safe with this interface: its structures state their sizes, its
handles are opaque, and everything else is a function. The declarations are read from the header itself, so they cannot
differ from it.
"""

import pathlib
import re

from cffi import FFI

HEADER = pathlib.Path(__file__).resolve().parents[2] / "library" / "include" / "pinwell" / "ticket_c.h"


def declarations(header: str) -> str:
    """The header without comments, directives and attributes."""
    text = re.sub(r"/\*.*?\*/", "", header, flags=re.DOTALL)
    text = re.sub(r"#(?:[^\n]*\\\n)*[^\n]*", "", text)
    # Only the C++ compiler sees these braces.
    text = re.sub(r'extern "C" \{', "", text)
    text = re.sub(r"\n\}\s*$", "\n", text)
    return text.replace("PINWELL_API ", "")


ffi = FFI()
ffi.cdef(declarations(HEADER.read_text(encoding="utf-8")))
ffi.set_source("pinwell._ffi", None)
