"""Writes the definitions of an index as a `tags` file, in the extended format that editors read.

A line is a name, a file, an address and fields, separated by tabs, sorted by bytes. The address is the
line number alone: no pattern, so nothing of the source can be mistaken for a command of the editor. The
trap: a tab or a line end in a file name would break the line, so both and the backslash are escaped as
the format's `TAG_FIELD`s are.
"""

from __future__ import annotations

import os
from collections.abc import Iterator

from quillet.index.facts import Hit, definitions_in, imports_in
from quillet.index.questions import Index
from quillet.index.store import CLASS, FUNCTION

_PSEUDO_TAGS = (
    b'!_TAG_FILE_FORMAT\t2\t/extended format; --format=1 will not append ;" to lines/',
    b"!_TAG_FILE_SORTED\t1\t/0=unsorted, 1=sorted, 2=foldcase/",
    b"!_TAG_KIND_DESCRIPTION!Python\tI,namespace\t/name referring a module defined in other file/",
    b"!_TAG_KIND_DESCRIPTION!Python\tc,class\t/classes/",
    b"!_TAG_KIND_DESCRIPTION!Python\tf,function\t/functions/",
    b"!_TAG_KIND_DESCRIPTION!Python\tm,member\t/class members/",
    b"!_TAG_KIND_DESCRIPTION!Python\tv,variable\t/variables/",
    b"!_TAG_KIND_DESCRIPTION!Python\tx,unknown\t/name defined in other module/",
    b"!_TAG_OUTPUT_MODE\tu-ctags\t/u-ctags or e-ctags/",
    b"!_TAG_PROGRAM_NAME\tquillet\t//",
)


def tag_lines(index: Index, base: str) -> Iterator[bytes]:
    """The lines of the file, in order and without their ends. Paths are given from the folder `base`."""
    lines = set()
    for facts in index.facts(index.files()):
        path = os.path.relpath(index.full_path(facts.row.path), base)
        file = escape(os.fsencode(path))
        classes = {""}
        hits = definitions_in(facts.hits, imports=True)
        imports = imports_in(facts.hits)
        classes.update(_inner(hit) for hit in hits if hit.opens == CLASS)
        for hit in hits:
            name = escape(hit.name.encode("utf-8", "surrogatepass"))
            if not name or b" " in name or name.startswith(b"!"):
                continue  # a target such as `a[b, c]`, which no editor asks for
            fields = [b"line:%d" % hit.line, b"language:Python"]
            if hit.scope:
                keyword = b"class" if hit.scope in classes else b"function"
                fields.append(keyword + b":" + escape(hit.scope.encode("utf-8", "surrogatepass")))
            address = b'%d;"' % hit.line
            lines.add(b"\t".join([name, file, address, _kind(hit, classes, imports), *fields]))
    yield from _PSEUDO_TAGS
    yield from sorted(lines)


def escape(value: bytes) -> bytes:
    """A field's value, with the bytes that would end it written as escapes."""
    value = value.replace(b"\\", b"\\\\")
    return b"".join(b"\\x%02x" % byte if byte < 0x20 or byte == 0x7F else bytes((byte,)) for byte in value)


def _inner(hit: Hit) -> str:
    return f"{hit.scope}.{hit.name}" if hit.scope else hit.name


def _kind(hit: Hit, classes: set[str], imports: dict[tuple[int, int], str]) -> bytes:
    if (hit.line, hit.column) in imports:
        return b"I" if imports[hit.line, hit.column] == "import" else b"x"
    if hit.opens == CLASS:
        return b"c"
    if hit.opens == FUNCTION:
        return b"m" if hit.scope and hit.scope in classes else b"f"
    return b"v"
