"""The answers that agents get: pages of places with their source lines, as text and as data.

An answer is read by a model, so it is short: paths once a file, lines cut, no more items than asked for, and what it
says of the rest is how to get it.
"""

from __future__ import annotations

from collections.abc import Callable, Iterable, Sequence
from dataclasses import dataclass
from typing import Any, NamedTuple

from quillet._workspace import Call, Location, OutlineItem
from quillet.agents.targets import QuestionError, Roots, Target, definitions_named, only_one_named, place
from quillet.settings import Settings

TYPE_CHECKING = False
if TYPE_CHECKING:
    from quillet._workspace import Certainty

LIMIT = 50
LIMIT_AT_MOST = 200
# Characters: of a source line, of a documentation, and of the text of a whole answer.
_LINE_AT_MOST = 160
_DOCUMENTATION_AT_MOST = 2000
_TEXT_AT_MOST = 20_000
# Lines that a definition shows of its source.
_SOURCE_LINES_AT_MOST = 200
_SYMBOLS_AT_MOST = 1000


@dataclass(frozen=True)
class Page:
    """`items` from `offset` on, of `total`. `next_offset` asks for what follows, None where nothing does. `bounded`
    says that the search met the bound of its work, so that there may be more.
    """

    items: list[dict[str, Any]]
    total: int
    offset: int
    next_offset: int | None
    bounded: bool


class Answer(NamedTuple):
    """A text for a reader, and the same as data."""

    text: str
    data: Page


class _Line(NamedTuple):
    """An item of a page: the file under which it is shown, its text, and its data."""

    path: str
    text: str
    item: dict[str, Any]


class Answers:
    """Answers about one project. Methods raise `QuestionError` for what cannot be asked, and `OSError`."""

    def __init__(self, settings: Settings) -> None:
        self._settings = settings
        self._workspace = settings.workspace()
        self._roots = Roots(self._workspace.roots)

    # ---- names ----

    def find_symbol(self, query: str, kind: str | None, limit: int, offset: int) -> Answer:
        if not query:
            raise QuestionError("the query is empty")
        found = self._workspace.symbols(query, limit=_SYMBOLS_AT_MOST)
        lines = []
        for item in found:
            if kind is not None and item.kind != kind:
                continue
            path = self._roots.shown(item.path)
            name = f"{item.container}.{item.name}" if item.container else item.name
            data = {"name": name, "kind": item.kind, "path": path, "line": item.line, "column": item.column}
            lines.append(_Line("", f"{path}:{item.line}: {item.kind} {name}", data))
        more = "at least " if len(found) == _SYMBOLS_AT_MOST else ""
        return self._page(lines, limit, offset, lambda total: f"{more}{_count(total, 'symbol')} like {query!r}")

    def definition(self, target: Asked, source_lines: int, limit: int, offset: int) -> Answer:
        if target.path is None:
            found = definitions_named(self._workspace, target.name())
        else:
            found = self._workspace.definitions(*self._target(target), at_least=self._settings.certainty)
        shown = max(1, min(source_lines, _SOURCE_LINES_AT_MOST))
        lines = []
        for item in found:
            line = self._location(item)
            source = self._source(item, shown)
            lines.append(line._replace(text="\n".join([line.text, *(f"    {text}" for text in source[1:])])))
            line.item["source"] = "\n".join(source)
        return self._page(lines, limit, offset, lambda total: _count(total, "definition"))

    def references(self, target: Asked, at_least: Certainty | None, limit: int, offset: int) -> Answer:
        place = self._target(target)
        found = self._workspace.references(*place, at_least=at_least or self._settings.certainty)
        files = len({item.path for item in found})
        lines = map(self._location, found)
        return self._page(
            lines, limit, offset, lambda total: f"{_count(total, 'reference')} in {_count(files, 'file')}"
        )

    def callers(self, target: Asked, limit: int, offset: int) -> Answer:
        calls = self._workspace.callers(*self._target(target))
        return self._page(self._calls(calls), limit, offset, lambda total: _count(total, "call"))

    def callees(self, target: Asked, limit: int, offset: int) -> Answer:
        calls = self._workspace.callees(*self._target(target))
        return self._page(self._calls(calls), limit, offset, lambda total: _count(total, "call"))

    def hierarchy(self, target: Asked, up: bool, limit: int, offset: int) -> Answer:
        place = self._target(target)
        found = self._workspace.supertypes(*place) if up else self._workspace.subtypes(*place)
        what = "supertype" if up else "subtype"
        lines = map(self._location, filter(lambda item: self._settings.admits(item.certainty), found))
        return self._page(lines, limit, offset, lambda total: _count(total, what))

    def types(self, target: Asked) -> Answer:
        place = self._target(target)
        types = self._workspace.types(*place)
        hover = self._workspace.hover(*place)
        item: dict[str, Any] = {"types": types}
        parts = ["type: " + " | ".join(types) if types else "nothing is known of its type"]
        if hover is not None:
            documentation = _cut(hover.documentation, _DOCUMENTATION_AT_MOST)
            item.update(declaration=hover.text, documentation=documentation, certainty=hover.certainty)
            parts.insert(0, _cut(hover.text, _DOCUMENTATION_AT_MOST) + _mark(hover.certainty))
            if documentation:
                parts.append(documentation)
        page = Page(items=[item], total=1, offset=0, next_offset=None, bounded=self._workspace.was_bounded)
        return Answer("\n".join(parts), page)

    # ---- files ----

    def outline(self, path: str, depth: int, limit: int, offset: int) -> Answer:
        file = self._roots.path(path)
        lines: list[_Line] = []

        def add(items: Iterable[OutlineItem], level: int) -> None:
            for item in items:
                extent = f"{item.line}" if item.first_line == item.last_line else f"{item.first_line}-{item.last_line}"
                detail = _cut(item.detail, _LINE_AT_MOST)
                data = {
                    "name": item.name,
                    "kind": item.kind,
                    "detail": item.detail,
                    "level": level,
                    "line": item.line,
                    "column": item.column,
                    "first_line": item.first_line,
                    "last_line": item.last_line,
                }
                lines.append(_Line("", f"{'  ' * level}{extent} {item.kind} {item.name}{detail}", data))
                if level + 1 < depth:
                    add(item.children, level + 1)

        add(self._workspace.outline(file), 0)
        return self._page(
            lines, limit, offset, lambda total: f"{self._roots.shown(file)}: {_count(total, 'definition')}"
        )

    def problems(self, path: str, limit: int, offset: int) -> Answer:
        file = self._roots.path(path)
        lines = []
        for item in self._workspace.problems(file):
            if item.code not in self._settings.diagnostics:
                continue
            source = self._line(file, item.line)
            data = {**item._asdict(), "source": source}
            lines.append(_Line("", f"{item.line}:{item.column}: {item.code}: {item.message}\n    {source}", data))
        return self._page(lines, limit, offset, lambda total: f"{self._roots.shown(file)}: {_count(total, 'problem')}")

    # ---- parts ----

    def _target(self, asked: Asked) -> Target:
        if asked.path is None:
            return only_one_named(self._workspace, self._roots, asked.name())
        if asked.line is None:
            raise QuestionError("a path needs a line; without a path, give the dotted name as `symbol`")
        return place(self._workspace, self._roots.path(asked.path), asked.line, asked.column, asked.symbol)

    def _location(self, item: Location, note: str = "", **more: object) -> _Line:
        path = self._roots.shown(item.path)
        source = self._line(item.path, item.line)
        data = {**item._asdict(), "path": path, "source": source, **more}
        role = f" {item.role}" if item.role else ""
        return _Line(path, f"{item.line}:{item.column}{role}{note}: {source}{_mark(item.certainty)}", data)

    def _calls(self, calls: Iterable[Call]) -> Iterable[_Line]:
        for call in calls:
            for item in filter(lambda item: self._settings.admits(item.certainty), call.calls):
                # The function that is asked about has one end of the call, the one that is named the other.
                known = {"name": call.name, "defined": f"{self._roots.shown(call.path)}:{call.line}"}
                yield self._location(item, f" {call.name}", **known)

    def _line(self, path: str, line: int) -> str:
        return _cut(self._workspace.source_line(path, line).decode("utf-8", "backslashreplace").strip(), _LINE_AT_MOST)

    def _source(self, item: Location, most: int) -> list[str]:
        """The first lines of what is defined at a place, the place's own line first."""
        last = item.line
        if most > 1 and item.role == "definition":
            last = _last_line_at(self._workspace.outline(item.path), item) or item.line
        lines = [
            self._workspace.source_line(item.path, line).decode("utf-8", "backslashreplace")
            for line in range(item.line, min(last, item.line + most - 1) + 1)
        ]
        return [lines[0].strip(), *(_cut(text.rstrip(), _LINE_AT_MOST) for text in lines[1:])]

    def _page(self, lines: Iterable[_Line], limit: int, offset: int, title: Callable[[int], str]) -> Answer:
        if offset < 0 or not 1 <= limit <= LIMIT_AT_MOST:
            raise QuestionError(f"`limit` is 1 to {LIMIT_AT_MOST}, `offset` 0 or more")
        bounded = self._workspace.was_bounded
        every = list(lines)
        texts: list[str] = []
        items: list[dict[str, Any]] = []
        size = 0
        path = ""
        for line in every[offset : offset + limit]:
            added = [line.path, f"  {line.text}"] if line.path and line.path != path else []
            added = added or [f"  {line.text}" if line.path else line.text]
            size += sum(map(len, added))
            if items and size > _TEXT_AT_MOST:
                break
            path = line.path
            texts += added
            items.append(line.item)
        end = offset + len(items)
        following = end if end < len(every) else None
        texts.insert(0, title(len(every)) + (f", {offset + 1} to {end}" if items and len(items) < len(every) else ""))
        if following is not None:
            texts.append(f"{len(every) - end} more: offset={following}")
        if bounded:
            texts.append("the search met its bound: there may be more")
        page = Page(items=items, total=len(every), offset=offset, next_offset=following, bounded=bounded)
        return Answer("\n".join(texts), page)


class Asked(NamedTuple):
    """What a tool was asked about: a dotted name alone, or a place in a file."""

    symbol: str | None
    path: str | None
    line: int | None
    column: int | None

    def name(self) -> str:
        if not self.symbol:
            raise QuestionError("give a dotted name as `symbol`, or `path`, `line` and the name there as `symbol`")
        return self.symbol


def _count(number: int, what: str) -> str:
    return f"{number} {what}{'' if number == 1 else 's'}"


def _mark(certainty: str) -> str:
    return "" if certainty == "certain" else f"  [{certainty}]"


def _cut(text: str, most: int) -> str:
    return text if len(text) <= most else text[: most - 1] + "…"


def _last_line_at(items: Sequence[OutlineItem], place: Location) -> int | None:
    """The last line of what an outline has at a place."""
    for item in items:
        if item.line == place.line and item.column == place.column:
            return item.last_line
        if item.first_line <= place.line <= item.last_line:
            found = _last_line_at(item.children, place)
            if found is not None:
                return found
    return None
