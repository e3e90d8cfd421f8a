#!/usr/bin/env python3
"""Checks that the examples in README.md and docs/ show what the code does, or rewrites them.

An example is a comment that names a view, a block of source and a block of output:

    <!-- example: records 3.12 -->
    ```python
    x = 1
    ```
    ```text
    (what the view makes of it)
    ```

The views: `records` (each record raw and decoded), `tree` (the parse tree), `analyze` (what the command
line prints; the comment may name a file for it), `exact` and `exact_records` (`analyze` and `records` of an exact
reading), `find` (what it answers of the name in the comment), `names` (each
occurrence: place, text, role, kind or flags, and its variable's scope), `scopes` (each scope with its symbols).
The version is 3.12 where none is given.

    scripts/doc_examples.py            names the examples that are stale; exit code 1 where there is one
    scripts/doc_examples.py --write    rewrites them
"""

from __future__ import annotations

import argparse
import io
import os
import re
import sys
import tempfile
from collections.abc import Iterator
from contextlib import contextmanager
from pathlib import Path

from quillet import FileBindings, Record, analyze, bind
from quillet._batch import write_files
from quillet._trees import tree_text
from quillet.cli.output import output_format
from quillet.cli.show import Style

ROOT = Path(__file__).resolve().parent.parent
EXAMPLE = re.compile(
    r"(?P<head><!-- example: (?P<view>\w+)(?: (?P<version>\d\.\d+))?(?: (?P<file>\S+))? -->\n"
    r"```python\n(?P<source>.*?)```\n+```text\n)(?P<output>.*?)(?=```)",
    re.DOTALL,
)


def documents() -> list[Path]:
    """The files that may hold examples."""
    return [ROOT / "README.md", *sorted((ROOT / "docs").glob("*.md"))]


def records_view(source: str, version: tuple[int, int], _: str, *, exact: bool = False) -> str:
    """One record a line: name, raw info, kind and detail. Parameters are marked."""
    rows: list[tuple[str, str, Record]] = []
    for line in analyze(source, version=version, exact=exact).lines:
        logical = line.logical
        raw = [*(logical.fTypeEquivs or ()), *(logical.fArgTypeEquivs or ())]
        rows += [(name.decode(), info.decode(), record) for (name, info), record in zip(raw, line.records, strict=True)]
    widths = [max((len(row[column]) for row in rows), default=0) for column in (0, 1)]
    out = []
    for name, info, record in rows:
        kind = f"{'parameter ' if record.is_parameter else ''}{record.kind.value}"
        out.append(f"{name:{widths[0]}}  {info:{widths[1]}}  {kind}  {record.detail}".rstrip() + "\n")
    return "".join(out)


def exact_records_view(source: str, version: tuple[int, int], _: str) -> str:
    """The records of an exact reading."""
    return records_view(source, version, "", exact=True)


def tree_view(source: str, version: tuple[int, int], _: str) -> str:
    """The trees of all statements."""
    analysis = analyze(source, version=version)
    return "".join(tree_text(line, analysis.analyzer) for line in analysis.lines)


def analyze_view(source: str, version: tuple[int, int], file: str, *, exact: bool = False) -> str:
    """What `quillet analyze` prints."""
    inputs = [(file.encode(), source.encode(), None)]
    form = output_format("text", errors_only=False, style=Style(on=False))
    results = write_files(inputs, version=version, jobs=1, form=form, exact=exact)
    return "".join(bytes(result).decode() for result in results)


def exact_view(source: str, version: tuple[int, int], file: str) -> str:
    """What `quillet analyze --exact` prints."""
    return analyze_view(source, version, file, exact=True)


@contextmanager
def working_folder(folder: str) -> Iterator[None]:
    """Works in a folder for a while, since paths are shown from there."""
    before = os.getcwd()
    os.chdir(folder)
    try:
        yield
    finally:
        os.chdir(before)


def find_view(source: str, version: tuple[int, int], name: str) -> str:
    """What `quillet find NAME --long` prints of the source as shop.py."""
    from quillet.cli.find import show_answers
    from quillet.index.questions import Folder, Query, match_of

    with tempfile.TemporaryDirectory() as folder, working_folder(folder):
        Path("shop.py").write_text(source, encoding="utf-8")
        out = io.StringIO()
        show_answers(out, Folder(".", version), Query(name, match_of(name)), "long")
    return out.getvalue()


def qualified(bindings: FileBindings, index: int | None) -> str:
    """The name of a scope with those around it."""
    parts = []
    while index:
        scope = bindings.scopes[index]
        parts.append(scope.name or scope.kind)
        index = scope.parent
    return ".".join(reversed(parts)) or "module"


def aligned(rows: list[list[str]]) -> str:
    """Rows as columns."""
    widths = [max(map(len, column)) for column in zip(*rows, strict=True)]
    lines = ["  ".join(f"{cell:{width}}" for cell, width in zip(row, widths, strict=True)) for row in rows]
    return "".join(line.rstrip() + "\n" for line in lines)


def names_view(source: str, version: tuple[int, int], _: str) -> str:
    """One occurrence a line."""
    bindings = bind(source, version=version)
    rows = []
    for o in bindings.occurrences:
        if o.symbol is not None:
            whose = f"{o.symbol.name} of {qualified(bindings, o.symbol.scope)}"
        elif o.receiver is not None:
            whose = f"of {bindings.occurrences[o.receiver].text}"
        else:
            whose = "attribute" if o.is_attribute else ""
        marks = ", ".join(filter(None, [o.kind, *sorted(o.flags)]))
        rows.append([f"{o.line}:{o.column}", o.text, o.role, marks, whose])
    return aligned(rows)


def scopes_view(source: str, version: tuple[int, int], _: str) -> str:
    """One scope a line, with its symbols."""
    bindings = bind(source, version=version)
    rows = []
    for index, scope in enumerate(bindings.scopes):
        symbols = " ".join(f"{symbol.name}{' (free)' if symbol.is_free() else ''}" for symbol in scope.symbols)
        extent = f"{scope.first_line}-{scope.last_line}"
        rows.append([str(index), extent, scope.kind, scope.name, str(scope.parent or 0) if index else "", symbols])
    return aligned(rows)


VIEWS = {
    "records": records_view,
    "tree": tree_view,
    "analyze": analyze_view,
    "exact": exact_view,
    "exact_records": exact_records_view,
    "find": find_view,
    "names": names_view,
    "scopes": scopes_view,
}


def output_of(match: re.Match[str]) -> str:
    """What the example's output block must hold."""
    major, minor = (match["version"] or "3.12").split(".")
    return VIEWS[match["view"]](match["source"], (int(major), int(minor)), match["file"] or "example.py")


def stale_examples(path: Path) -> list[str]:
    """The sources of the examples of a file whose output is not what the code does."""
    return [
        match["source"]
        for match in EXAMPLE.finditer(path.read_text(encoding="utf-8"))
        if match["output"] != output_of(match)
    ]


def main() -> int:
    """Runs the command."""
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--write", action="store_true", help="rewrite the examples that are stale")
    write = parser.parse_args().write
    found = False
    for path in documents():
        for source in stale_examples(path):
            found = True
            print(f"{path.relative_to(ROOT)}: {'rewritten' if write else 'stale'}: {source.splitlines()[0]}")
        if write:
            text = path.read_text(encoding="utf-8")
            path.write_text(EXAMPLE.sub(lambda match: match["head"] + output_of(match), text), encoding="utf-8")
    return 1 if found and not write else 0


if __name__ == "__main__":
    sys.exit(main())
