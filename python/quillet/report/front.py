"""The first page of the site: what there is in numbers, what is wrong, and all files as a tree of folders."""

from __future__ import annotations

from collections.abc import Iterator
from html import escape
from typing import NamedTuple

from quillet.report.markup import PAGE_END, page_head, shown

# As many errors are listed; the pages of the files show them all.
_MOST_ERRORS = 500
# A folder stands open where the tree has no more files than this.
_MOST_OPEN = 60


class FilePage(NamedTuple):
    """What the first page says of a file."""

    number: int
    name: str
    lines: int
    statements: int
    errors: list[tuple[int, int, str]]
    problem: str | None


class _Folder:
    def __init__(self) -> None:
        self.folders: dict[str, _Folder] = {}
        self.files: list[FilePage] = []
        self.file_count = 0
        self.line_count = 0
        self.error_count = 0

    def add(self, page: FilePage) -> None:
        """Takes a page of this folder, or of one below, into its sums."""
        self.file_count += 1
        self.line_count += page.lines
        self.error_count += len(page.errors) or page.problem is not None


def front_page(pages: list[FilePage], definitions: int, scripts: int) -> str:
    """The page, from what was found in each file."""
    top = _tree(pages)
    numbers = [("file", top.file_count), ("line", top.line_count), ("definition", definitions)]
    numbers.append(("syntax error", sum(len(page.errors) for page in pages)))
    body = [
        '<main class="front">\n<ul class="numbers">',
        *(f"<li><strong>{count:,}</strong> {escape(word)}{'' if count == 1 else 's'}</li>" for word, count in numbers),
        "</ul>\n",
        *_errors(pages),
        '<section><h2>Files</h2>\n<div class="tree">\n',
        *_rows(top, len(pages) <= _MOST_OPEN),
        "</div></section>\n</main>\n",
    ]
    head = page_head("quillet report", up="", crumb="", data={"scripts": scripts})
    return head + "".join(body) + PAGE_END


def _errors(pages: list[FilePage]) -> Iterator[str]:
    listed = []
    count = 0
    for page in pages:
        link = f"files/{page.number}.html"
        if page.problem is not None:
            listed.append(
                f'<li><a href="{link}">{shown(page.name)}</a> {shown(page.problem.partition(chr(10))[0])}</li>\n'
            )
        for line, column, message in page.errors[: _MOST_ERRORS - len(listed)]:
            place = f"{shown(page.name)}:{line}:{column}"
            listed.append(f'<li><a href="{link}#L{line}">{place}</a> {shown(message)}</li>\n')
        count += len(page.errors) or page.problem is not None
    if listed:
        more = f"<p>and {count - _MOST_ERRORS:,} more</p>\n" if count > _MOST_ERRORS else ""
        items = "".join(listed[:_MOST_ERRORS])
        title = f"<h2>Errors <small>{count:,}</small></h2>"
        yield f'<section>{title}\n<ul class="errors">\n{items}</ul>\n{more}</section>\n'


def _tree(pages: list[FilePage]) -> _Folder:
    top = _Folder()
    for page in pages:
        folder = top
        folder.add(page)
        for part in page.name.split("/")[:-1]:
            folder = folder.folders.setdefault(part, _Folder())
            folder.add(page)
        folder.files.append(page)
    return top


def _rows(folder: _Folder, is_open: bool) -> Iterator[str]:
    """The entries of a folder; without recursion, since paths may be deep."""
    pending: list[str | tuple[str, _Folder]] = [("", folder)]
    while pending:
        item = pending.pop()
        if isinstance(item, str):
            yield item
            continue
        name, inner = item
        while not inner.files and len(inner.folders) == 1:  # a folder that holds one folder alone
            [(only, inner)] = inner.folders.items()
            name = f"{name}/{only}" if name else only
        if name:
            yield (
                f"<details{' open' if is_open else ''}><summary><span>{shown(name)}/</span>"
                f"{_counts(inner.file_count, inner.line_count, inner.error_count)}</summary>\n"
            )
            pending.append("</details>\n")
        files = []
        for page in inner.files:
            errors = len(page.errors) or page.problem is not None
            files.append(
                f'<a href="files/{page.number}.html"><span>{shown(page.name.rpartition("/")[2])}</span>'
                f"{_counts(None, page.lines, errors)}</a>\n"
            )
        pending.append("".join(files))
        pending += reversed(inner.folders.items())


def _counts(files: int | None, lines: int, errors: int) -> str:
    parts = []
    if errors:
        parts.append(f'<em class="bad">{errors:,} {"error" if errors == 1 else "errors"}</em>')
    if files is not None:
        parts.append(f"<em>{files:,} {'file' if files == 1 else 'files'}</em>")
    parts.append(f"<em>{lines:,}</em>")
    return "".join(parts)
