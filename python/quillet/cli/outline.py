"""`quillet outline`: the classes and functions of a file as a tree, with their signatures.

The definitions are those of the file's names, so one that has a syntax error is among them, and marked. A signature
is what the source has between the name and the colon, on one line; hints that only a comment gives are those of the
records. A head whose brackets its line leaves open and that has a syntax error may go anywhere, so of that one the
names of the parameters are shown.
"""

from __future__ import annotations

import json
import os
import re
from collections.abc import Iterator, Sequence
from typing import NamedTuple

from quillet._names import FileBindings, Occurrence, bind
from quillet._source import SourceEncodingError, to_utf8
from quillet.cli.defs import facts_of, shown_path, version_of
from quillet.cli.files import problem_of, read_file
from quillet.cli.find import fail
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.index.facts import FileFacts, Hit
from quillet.index.questions import DEFINING_USES, Folder
from quillet.index.store import CLASS, FUNCTION, IndexProblem

# How much of a signature is shown to people, in characters, and how far a head is read for it, in bytes.
_WINDOW = 160
_MOST_READ = 1 << 14
_TOKEN = re.compile(
    rb"""(?P<gap>(?:[ \t\f\r\n]|\\\r?\n|\#[^\r\n]*)+)
    |(?P<text>[bBfFrRtTuU]{0,2}(?:\'\'\'(?:\\.|[^\\])*?\'\'\'|\"\"\"(?:\\.|[^\\])*?\"\"\"
        |'(?:\\.|[^'\\\r\n])*'|"(?:\\.|[^"\\\r\n])*"))
    |(?P<word>[\w\x80-\xff]+)|(?P<open>[(\[{])|(?P<close>[)\]}])|(?P<arrow>->)|\*\*|.""",
    re.VERBOSE | re.DOTALL,
)
_ASYNC = re.compile(rb"\basync[ \t\f]+def[ \t\f]+\Z")


class Definition(NamedTuple):
    """A class or function. `kind` is "class", "function" or "async function", `scopes` are the names of the classes
    and functions around, from the outermost on."""

    line: int
    column: int
    scopes: tuple[str, ...]
    name: str
    kind: str
    signature: str
    is_broken: bool


def run(path: str, *, index: str | None, as_json: bool) -> int:
    """Runs the command and returns its exit code."""
    try:
        facts = facts_of(path, index, Folder.everything(uses=DEFINING_USES))
        source = _source_of(path)
        bindings = bind(source, version=version_of(index))
    except IndexProblem as problem:
        return fail(problem)
    except OverflowError as problem:
        return fail(IndexProblem(f"{path}: {problem}"))
    found = False
    with quiet_output() as out:
        style = Style.of_stdout()
        digits = len(str(facts.lines))
        for definition in outline(facts, bindings, to_utf8(source)):
            found = True
            out.write(_json(shown_path(path), definition) if as_json else _line(definition, digits, style))
    return 0 if found else 1


def _source_of(path: str) -> bytes:
    try:
        source = read_file(os.path.abspath(path))
        to_utf8(source)
    except (OSError, SourceEncodingError) as error:
        raise IndexProblem(f"{path}: {problem_of(error)}") from error
    return source


def _line(definition: Definition, digits: int, style: Style) -> str:
    """A line of the tree, with the line number in front."""
    signature = definition.signature
    if len(signature) > _WINDOW:
        signature = signature[: _WINDOW - 1] + "…"
    word = definition.kind.replace("function", "def")
    mark = "  " + style.error("syntax error") if definition.is_broken else ""
    place = style.place(f"{definition.line:>{digits}}")
    name = style.name(printable(definition.name))
    return f"{place} {'    ' * len(definition.scopes)}{word} {name}{printable(signature)}{mark}\n"


def _json(path: str, definition: Definition) -> str:
    row = {
        "type": "definition",
        "path": path,
        "line": definition.line,
        "column": definition.column,
        "scope": ".".join(definition.scopes),
        "name": definition.name,
        "kind": definition.kind,
        "signature": definition.signature,
        "depth": len(definition.scopes),
        "is_broken": definition.is_broken,
    }
    return json.dumps(row, ensure_ascii=True, separators=(",", ":")) + "\n"


def outline(facts: FileFacts, bindings: FileBindings, source: bytes) -> Iterator[Definition]:
    """The definitions, in the order of the source, which is UTF-8."""
    occurrences = bindings.occurrences
    source = source.removeprefix(b"\xef\xbb\xbf")
    starts = [0, *(match.end() for match in re.finditer(rb"\r\n|\r|\n", source))]
    recorded = {(hit.line, hit.column): place for place, hit in enumerate(facts.hits) if hit.opens in (CLASS, FUNCTION)}
    for index, occurrence in enumerate(occurrences):
        if occurrence.role != "definition" or occurrence.kind not in ("class", "function"):
            continue
        place = recorded.get((occurrence.line, occurrence.column))
        kind, signature = "class", ""
        if occurrence.kind == "function":
            hints = _hints(facts.hits, place) if place is not None else {}
            start = starts[occurrence.line - 1]
            is_async = _ASYNC.search(source, start, start + occurrence.column - 1)
            kind = "async function" if is_async else "function"
            behind = start + occurrence.end_column - 1
            tokens = _TOKEN.finditer(source, behind, behind + _MOST_READ)
            signature = _signature(tokens, hints, one_line=place is None)
            if not signature:
                signature = f"({', '.join(_parameters(bindings, occurrences, index))})"
        scopes = _scopes_around(bindings, occurrence)
        yield Definition(
            occurrence.line, occurrence.column, scopes, occurrence.text, kind, signature, is_broken=place is None
        )


def _scopes_around(bindings: FileBindings, occurrence: Occurrence) -> tuple[str, ...]:
    """The names of the classes and functions that stand around a name."""
    names: list[str] = []
    at: int | None = occurrence.scope
    while at is not None:
        scope = bindings.scopes[at]
        if scope.kind in ("class", "function"):
            names.append(scope.name)
        at = scope.parent
    return tuple(reversed(names))


def _parameters(bindings: FileBindings, occurrences: Sequence[Occurrence], index: int) -> Iterator[str]:
    """The parameters of the function whose name stands at an index: those of the first function behind it, as far as
    they stand in front of any other definition.
    """
    function = None
    for later in range(index + 1, len(occurrences)):
        occurrence = occurrences[later]
        if occurrence.kind in ("class", "function") and occurrence.role == "definition":
            return
        if occurrence.kind == "parameter" and bindings.scopes[occurrence.scope].kind == "function":
            function = occurrence.scope if function is None else function
            if occurrence.scope == function:
                yield occurrence.text


def _hints(records: list[Hit], place: int) -> dict[str, str]:
    """The hints of a function, which follow its own record in the records of its statement."""
    function = records[place]
    if function.opens != FUNCTION:
        return {}
    inner = f"{function.scope}.{function.name}" if function.scope else function.name
    hints: dict[str, str] = {}
    for later in range(place + 1, len(records)):
        hit = records[later]
        if hit.opens or hit.is_parameter != (hit.scope == inner):
            break
        if hit.is_parameter and hit.kind == "hint":
            hints[hit.name] = hit.detail
    return hints


def _signature(tokens: Iterator[re.Match[bytes]], hints: dict[str, str], *, one_line: bool) -> str:
    """What the tokens in front of the colon say, on one line, with `hints` for what has none there. It is empty where
    `one_line` is asked for and the first line ends within brackets.
    """
    shown: list[str] = []
    opened: list[bytes] = []
    before = b""  # the last token that is no gap
    gap = False
    unsaid = ""  # the hint of the parameter just named, unless its own follows
    has_arrow = False
    for match in tokens:
        token = match[0]
        if match["gap"]:
            breaks = b"\n" in token or b"\r" in token
            if breaks and one_line and opened:
                return ""
            if breaks and not opened and b"\\" not in token:
                break
            gap = True
            continue
        if token == b":" and not opened:
            break
        if unsaid and token != b":":
            shown.append(f": {unsaid}")
        unsaid = ""
        if match["close"]:
            if before == b"," and opened == [b"("]:
                shown.pop()
            if opened:
                opened.pop()
        elif gap and before not in (b"", b"(", b"[", b"{"):
            shown.append(" ")
        gap = False
        shown.append(token.decode("utf-8", "replace"))
        if match["open"]:
            opened.append(token)
        elif match["word"] and opened == [b"("] and before in (b"(", b",", b"*", b"**"):
            unsaid = hints.get(shown[-1], "")
        has_arrow = has_arrow or match["arrow"] is not None
        before = token
    if one_line and opened:
        return ""
    returned = f" -> {hints['return']}" if "return" in hints and not has_arrow else ""
    return "".join(shown) + returned
