"""Writes the site: `index.html`, a page a file under `files`, the places of names under `data`.

The files are read twice, on all cores. The first round finds what is defined and where names occur; the
second writes each file's page, whose links need that. The core does both and holds little: places of names
wait in a spill on the disk, and a page is gone when it is written. So memory does not grow with the files,
but for their list and for the definitions.
What a page loads are scripts that call `quillet.take`, since a page that is opened from disk may load scripts
and nothing else.
"""

from __future__ import annotations

import builtins
import io
import json
import os
import shutil
from collections.abc import Callable, Iterator
from contextlib import closing
from pathlib import Path
from typing import BinaryIO, NamedTuple

from quillet._batch import write_files
from quillet.report.folder import new_site
from quillet.report.front import FilePage, front_page
from quillet.report.markup import PAGE_END, page_head, shown
from quillet.tarvex import _host

_ASSETS = ("style.css", "script.js")
# Places of names go to the spill when so many bytes wait.
_MOST_WAITING = 16 << 20
_CUTS = {
    b"first-lines": f"too large for a page, which shows the first {_host.SITE_MOST_BYTES >> 20} MB",
    b"cut-lines": f"has endless lines, of which its page shows the first {_host.SITE_MOST_BYTES_OF_LINE} bytes",
}


class Source(NamedTuple):
    """A file to show: its path, and the name that the site has for it."""

    path: str
    name: str


class Settings(NamedTuple):
    """How the files are read: the version of Python, and the number of threads (None for one a core)."""

    version: tuple[int, ...] | None = None
    jobs: int | None = None


class Reports(NamedTuple):
    """What is called while a site is written: with a file that cannot be read and the reason, with a file
    that is shown in part and what is left out, with the name of a part of the work and its steps, and behind
    each step."""

    unread: Callable[[str, str], None]
    cut: Callable[[str, str], None]
    begin: Callable[[str, int], None]
    advance: Callable[[], None]


def write_site(sources: list[Source], folder: str, settings: Settings, reports: Reports) -> int:
    """Writes the site and returns the number of files that could not be read.

    Raises `SiteProblem` and OSError; then the folder is as it was.
    """
    with new_site(folder) as site:
        for name in ("files", "data"):
            (site / name).mkdir()
        for name in _ASSETS:
            shutil.copyfile(Path(__file__).parent / name, site / name)
        _write_json(site / "data" / "files.js", [source.name for source in sources])

        index = _host.SiteIndex([source.name for source in sources], _builtin_attributes())
        with (site / "spill").open("w+b") as file:
            spill = _Spill(file)
            reports.begin("reading", len(sources))
            for result in _results(sources, settings, ("site survey",)):
                if result.problem is None:
                    index.Add(result.index, result)
                if index.waiting_bytes > _MOST_WAITING:
                    spill.add(index.TakeBuckets())
                reports.advance()
            spill.add(index.TakeBuckets())
            for group in range(index.script_count):
                script = index.PlacesScript(spill.group(group, index.script_count))
                (site / "data" / f"{group}.js").write_bytes(script)
        os.unlink(site / "spill")
        (site / "data" / "names.js").write_bytes(index.DefinitionsScript())

        pages = _write_pages(sources, settings, index, site, reports)
        (site / "index.html").write_bytes(_encoded(front_page(pages, index.definition_count, index.script_count)))
    return sum(page.problem is not None for page in pages)


def _builtin_attributes() -> list[str]:
    """The attributes of the language's own types, which say little of what they belong to."""
    types = [value for value in vars(builtins).values() if isinstance(value, type)]
    plain = [value for value in types if not issubclass(value, BaseException)]
    return sorted({name for value in (*plain, io.TextIOWrapper) for name in dir(value)})


def _results(sources: list[Source], settings: Settings, form: tuple[object, ...]) -> Iterator[_host.FileResult]:
    inputs = [(os.fsencode(source.path), None, None) for source in sources]
    with closing(write_files(inputs, version=settings.version, jobs=settings.jobs, form=form)) as results:
        yield from results


def _write_pages(
    sources: list[Source], settings: Settings, index: _host.SiteIndex, site: Path, reports: Reports
) -> list[FilePage]:
    """Writes the pages of all files, and gives what the front page says of each."""
    pages = []
    reports.begin("writing", len(sources))
    scripts = index.script_count
    for result in _results(sources, settings, ("site page", index)):
        number = result.index
        source = sources[number]
        head = page_head(
            f"{source.name} · quillet",
            up="../",
            crumb=source.name,
            data={"file": number, "scripts": scripts},
        )
        with (site / "files" / f"{number}.html").open("wb") as page:
            page.write(_encoded(head))
            if result.problem is not None:
                reports.unread(source.path, result.problem)
                page.write(_encoded(_notice(f"This file could not be read as Python: {_first_line(result.problem)}")))
            else:
                for line, _, message in result.reports:
                    page.write(_encoded(_notice(f"Line {line}: {_first_line(message)}")))
                shows = _write_body(page, result, site / "files" / f"{number}.js")
                if shows in _CUTS:
                    reports.cut(source.path, _CUTS[shows])
            page.write(PAGE_END.encode())
        pages.append(
            FilePage(number, source.name, result.line_count, result.statement_count, result.errors, result.problem)
        )
        reports.advance()
    return pages


def _write_body(page: BinaryIO, result: _host.FileResult, lines: Path) -> bytes:
    """Writes what the core made of a file; the word for how much of it that shows."""
    output = memoryview(result)
    start = _host.SITE_PAGE_HEAD_SIZE
    size, shows = bytes(output[:start]).split()
    end = start + int(size)
    page.write(b'<div class="columns">\n')
    page.write(output[start:end])
    page.write(b"</div>\n")
    lines.write_bytes(output[end:])
    return shows


def _first_line(text: str) -> str:
    return text.partition("\n")[0]


def _notice(text: str) -> str:
    return f'<p class="notice">{shown(text)}</p>\n'


def _encoded(text: str) -> bytes:
    return text.encode("utf-8", "backslashreplace")


def _write_json(path: Path, value: object) -> None:
    text = json.dumps(value, ensure_ascii=True, separators=(",", ":"))
    path.write_text(f"quillet.take({text});\n", encoding="ascii")


class _Spill:
    """The places of names on disk, by bucket, in the order in which they came."""

    def __init__(self, file: BinaryIO) -> None:
        self._file = file
        self._at = 0
        self._chunks: dict[int, list[tuple[int, int]]] = {}

    def add(self, buckets: list[bytes]) -> None:
        for bucket, data in enumerate(buckets):
            if data:
                self._file.write(data)
                self._chunks.setdefault(bucket, []).append((self._at, len(data)))
                self._at += len(data)

    def group(self, group: int, count: int) -> bytes:
        """All of the buckets whose number modulo `count` is `group`."""
        parts = []
        for bucket in sorted(self._chunks):
            if bucket % count == group:
                for at, size in self._chunks[bucket]:
                    self._file.seek(at)
                    parts.append(self._file.read(size))
        return b"".join(parts)
