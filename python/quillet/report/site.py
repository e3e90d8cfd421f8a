"""Writes the site: `index.html`, a page a file under `files`, the places of names under `data`.

A page links each name to its nearest definition; its script shows all definitions and uses. The places
of names are in scripts by the name's number, loaded when a name is asked for, since a page that is opened
from disk may load scripts and nothing else.
"""

from __future__ import annotations

import json
import os
import shutil
from collections import defaultdict
from collections.abc import Callable, Iterable
from html import escape
from pathlib import Path
from typing import NamedTuple

from quillet.index.questions import FileRow, Hit, Index
from quillet.index.source import SourceFile
from quillet.index.store import CLASS, FUNCTION
from quillet.report.source_page import Link, is_name, place_links, rows, shown

SHARDS = 64
_MARK = ".quillet-report"
_ASSETS = ("style.css", "script.js")
# More places of one name than this are counted and not listed.
_MAX_PLACES = 300
_MAX_FACTS = 4

_ROLES = {"set": "set", "get": "read", "called": "called", "import": "import", "from_import": "import"}
_POLICY = "default-src 'none'; style-src 'self' file:; script-src 'self' file:"


class SiteProblem(Exception):
    """A folder that the site cannot be written to; the text says why."""


class _File(NamedTuple):
    number: int
    row: FileRow
    path: str
    hits: list[Hit]


def write_site(index: Index, folder: str, changed: Callable[[str], None]) -> int:
    """Writes the site and returns the number of its files. Raises `SiteProblem` and OSError."""
    target = Path(folder)
    if target.exists() and not target.is_dir():
        raise SiteProblem(f"{folder}: is no folder; name another one with -o")
    if target.is_dir() and any(target.iterdir()) and not (target / _MARK).exists():
        raise SiteProblem(f"{folder}: holds something else than a report; name another folder with -o")
    target.mkdir(parents=True, exist_ok=True)
    (target / _MARK).write_text("This folder is written anew by quillet report.\n")
    for name in ("files", "data"):
        shutil.rmtree(target / name, ignore_errors=True)
        (target / name).mkdir()
    for name in _ASSETS:
        shutil.copyfile(Path(__file__).parent / name, target / name)

    files = [
        _File(number, row, _path_of(index, row), index.records_of(row)) for number, row in enumerate(index.files())
    ]
    names = _Names(files)
    for file in files:
        source = SourceFile(index.full_path(file.row.path), file.row)
        if source.changed:
            changed(file.path)
        page = _file_page(file, source, index.errors_of(file.row), names)
        _write(target / "files" / f"{file.number}.html", page)
    names.write(target / "data", files)
    _write(target / "index.html", _front_page(index, files))
    return len(files)


def _path_of(index: Index, row: FileRow) -> str:
    return os.fsencode(index.full_path(row.path) if row.path.startswith(b"/") else os.fsdecode(row.path)).decode(
        "utf-8", "backslashreplace"
    )


def _write(path: Path, text: str) -> None:
    path.write_bytes(text.encode("utf-8", "backslashreplace"))


class _Names:
    """The names of the site by number, their places, and where each is defined."""

    def __init__(self, files: list[_File]) -> None:
        self.number: dict[str, int] = {}
        self._places: dict[str, dict[tuple[int, int, int], list[str]]] = defaultdict(dict)
        # By the last part of a name: the classes and functions of that name.
        self._opened: dict[str, tuple[int, int]] = {}
        for file in files:
            for hit in file.hits:
                role = _ROLES.get(hit.kind)
                if role is None or not is_name(hit.name):
                    continue
                if hit.is_parameter:
                    role = "parameter"
                elif hit.opens:
                    role = "class" if hit.opens == CLASS else "def"
                    self._opened.setdefault(hit.name, (file.number, hit.line))
                self.number.setdefault(hit.name, len(self.number))
                roles = self._places[hit.name].setdefault((file.number, hit.line, hit.column), [])
                if role not in roles:
                    roles.append(role)

    def definition(self, name: str) -> tuple[int, int] | None:
        """The class or function that a name's last part names somewhere in the site, as file and line."""
        return self._opened.get(name.rpartition(".")[2])

    def write(self, folder: Path, files: list[_File]) -> None:
        shards: list[dict[int, object]] = [{} for _ in range(SHARDS)]
        for name, number in self.number.items():
            places = self._places[name]
            listed = [[*place, " ".join(roles)] for place, roles in sorted(places.items(), key=_definitions_first)]
            tail = name.rpartition(".")[2]
            related = self.number.get(tail, -1) if tail != name else -1
            shards[number % SHARDS][number] = [name, len(listed), listed[:_MAX_PLACES], related]
        for number, shard in enumerate(shards):
            _write(folder / f"{number}.js", f"quillet.loaded({number}, {_json(shard)});\n")
        found = [
            [hit.name, hit.scope, file.number, hit.line]
            for file in files
            for hit in file.hits
            if hit.opens or (hit.kind == "set" and not hit.scope and is_name(hit.name))
        ]
        _write(folder / "names.js", f"quillet.named({_json(found)});\n")
        _write(folder / "files.js", f"quillet.files = {_json([file.path for file in files])};\n")


def _definitions_first(item: tuple[tuple[int, int, int], list[str]]) -> tuple[int, tuple[int, int, int]]:
    place, roles = item
    if "class" in roles or "def" in roles:
        return 0, place
    return (1 if set(roles) & {"set", "parameter", "import"} else 2), place


def _json(value: object) -> str:
    return json.dumps(value, ensure_ascii=True, separators=(",", ":"))


class _Scopes:
    """What is known of the names of one file, by the scope in which they stand."""

    def __init__(self, hits: list[Hit]) -> None:
        self._classes = {_inner(hit) for hit in hits if hit.opens == CLASS}
        self._defined: dict[tuple[str, str], int] = {}
        self._facts: dict[tuple[str, str], list[str]] = defaultdict(list)
        for hit in hits:
            key = self._home(hit.scope, hit.name), hit.name
            if hit.kind == "set":
                self._defined.setdefault(key, hit.line)
            elif hit.kind == "hint":
                self._facts[key].insert(0, f": {hit.detail}")
            elif hit.kind in ("literal", "equal", "expression") and hit.detail:
                self._facts[key].append(f"= {hit.detail}")
            elif hit.kind == "instance":
                self._facts[key].append(f"instance of {hit.detail}")
            elif hit.kind in ("import", "from_import"):
                self._facts[key].append(f"from {hit.detail}" if hit.kind == "from_import" else f"import {hit.detail}")

    def _home(self, scope: str, name: str) -> str:
        """The scope by which a name is kept: attributes of self belong to the class around the method."""
        if name.startswith(("self.", "cls.")):
            outer = scope.rpartition(".")[0]
            if outer in self._classes:
                return outer
        return scope

    def _around(self, scope: str, name: str) -> Iterable[tuple[str, str]]:
        yield self._home(scope, name), name
        if name.startswith(("self.", "cls.")):
            yield scope.rpartition(".")[0], name.partition(".")[2]
        while scope:
            scope = scope.rpartition(".")[0]
            if scope not in self._classes:
                yield scope, name

    def line_of(self, scope: str, name: str) -> int | None:
        """The line that defines what a name means in a scope."""
        for key in self._around(scope, name):
            if key in self._defined:
                return self._defined[key]
        return None

    def facts_of(self, scope: str, name: str) -> list[str]:
        """Hints and values, hints first."""
        for key in self._around(scope, name):
            if key in self._facts:
                return list(dict.fromkeys(self._facts[key]))[:_MAX_FACTS]
        return []


def _inner(hit: Hit) -> str:
    return f"{hit.scope}.{hit.name}" if hit.scope else hit.name


def _file_page(file: _File, source: SourceFile, found: list[tuple[int, int, str]], names: _Names) -> str:
    scopes = _Scopes(file.hits)
    by_line: dict[int, dict[tuple[int, str], Hit]] = defaultdict(dict)
    for hit in file.hits:
        if hit.name in names.number:
            key = hit.column, hit.name
            if key not in by_line[hit.line] or hit.is_parameter or hit.opens:
                by_line[hit.line][key] = hit
    errors: dict[int, list[tuple[int, str]]] = defaultdict(list)
    for line, column, message in found:
        errors[min(max(line, 1), max(len(source.lines), 1))].append((column, message))

    def links_of(line: int) -> list[Link]:
        if line not in by_line:
            return []
        wanted = [(hit.column, hit.name, _attributes(hit, scopes, names)) for hit in by_line[line].values()]
        return place_links(source.line(line), wanted)

    notices = []
    if file.row.problem is not None:
        notices.append(f"This file could not be read as Python: {file.row.problem}")
    elif source.content is None:
        notices.append("This file is gone since it was indexed.")
    elif source.changed:
        notices.append("This file changed since it was indexed; some links may be missing or off.")
    outline = "".join(
        f'<li style="--depth:{hit.scope.count(".") + 1 if hit.scope else 0}"><a href="#L{hit.line}">'
        f"<i>{'class' if hit.opens == CLASS else 'def'}</i> {shown(hit.name)}</a></li>\n"
        for hit in file.hits
        if hit.opens in (CLASS, FUNCTION)
    )
    lines = source.lines[:-1] if source.lines and not source.lines[-1] else source.lines
    body = (
        "".join(f'<p class="notice">{shown(notice)}</p>\n' for notice in notices)
        + f'<div class="columns"><nav class="outline"><h2>Outline</h2><ul>\n{outline}</ul></nav>\n'
        + f'<main class="source">\n{"".join(rows(lines, links_of, errors))}</main></div>\n'
        + '<aside id="panel" hidden></aside>\n'
    )
    return _page(file.path, body, up="../", crumb=file.path)


def _attributes(hit: Hit, scopes: _Scopes, names: _Names) -> str:
    line = scopes.line_of(hit.scope, hit.name)
    target = f"#L{line}"
    if line is None:
        other = names.definition(hit.name)
        target = f"{other[0]}.html#L{other[1]}" if other else f"#L{hit.line}"
    facts = scopes.facts_of(hit.scope, hit.name)
    tip = f' data-tip="{shown(hit.name + " " + "  ".join(facts))}"' if facts else ""
    kind = {CLASS: " class", FUNCTION: " def"}.get(hit.opens, " set" if hit.kind == "set" else "")
    return f'class="n{kind}" href="{target}" data-n="{names.number[hit.name]}"{tip}'


def _front_page(index: Index, files: list[_File]) -> str:
    counts = index.counts()
    listed = []
    wrong = []
    for file in files:
        errors = index.errors_of(file.row)
        note = f'<td class="bad">{len(errors)}</td>' if errors else "<td></td>"
        link = f"files/{file.number}.html"
        listed.append(
            f'<tr><td><a href="{link}">{shown(file.path)}</a></td><td>{file.row.lines}</td>'
            f"<td>{file.row.records}</td>{note}</tr>\n"
        )
        if file.row.problem is not None:
            wrong.append(f'<li><a href="{link}">{shown(file.path)}</a> {shown(file.row.problem)}</li>\n')
        wrong += (
            f'<li><a href="{link}#L{line}">{shown(file.path)}:{line}:{column}</a> {shown(message)}</li>\n'
            for line, column, message in errors
        )
    numbers = [("files", counts["files"]), ("lines", counts["lines"]), ("records", counts["records"])]
    numbers.append(("syntax errors", index.errors()))
    body = (
        '<ul class="numbers">'
        + "".join(f"<li><strong>{value:,}</strong> {escape(key)}</li>" for key, value in numbers)
        + "</ul>\n"
        + (f'<section><h2>Errors</h2><ul class="errors">\n{"".join(wrong)}</ul></section>\n' if wrong else "")
        + "<section><h2>Files</h2><table><thead><tr><th>File</th><th>Lines</th><th>Records</th><th>Errors</th></tr>"
        + f"</thead><tbody>\n{''.join(listed)}</tbody></table></section>\n"
    )
    return _page("quillet report", f'<main class="front">{body}</main>', up="", crumb="")


def _page(title: str, body: str, *, up: str, crumb: str) -> str:
    path = f"<span>{shown(crumb)}</span>" if crumb else ""
    return (
        '<!DOCTYPE html>\n<html lang="en"><head><meta charset="utf-8">\n'
        f'<meta http-equiv="Content-Security-Policy" content="{_POLICY}; style-src-attr \'unsafe-inline\'">\n'
        '<meta name="viewport" content="width=device-width, initial-scale=1">\n'
        f'<title>{shown(title)}</title>\n<link rel="stylesheet" href="{up}style.css">\n'
        f'<script src="{up}script.js" data-up="{up}" defer></script></head>\n'
        f'<body><header><a class="home" href="{up}index.html">quillet</a>{path}'
        '<label><input id="search" type="search" placeholder="Find a definition ( / )" autocomplete="off"></label>'
        f'</header><ol id="found" hidden></ol>\n{body}</body></html>\n'
    )
