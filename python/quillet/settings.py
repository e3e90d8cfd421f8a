"""What a project says about how it is to be read: the table `[tool.quillet]` of its pyproject.toml.

Servers take it from there, and from what their clients say on top of it. Nothing is guessed: a setting that is
unknown or of the wrong kind is an error that names the file, the line and what would be right.
"""

from __future__ import annotations

import os
import sys

from quillet._workspace import Workspace

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable, Iterable, Mapping
    from typing import Any, NamedTuple

    from quillet._workspace import Certainty, Columns
else:
    from quillet._named import NamedTuple

PROJECT_FILE = "pyproject.toml"
TABLE = "tool.quillet"
CERTAINTIES: tuple[Certainty, ...] = ("certain", "likely", "by name")
DIAGNOSTICS = ("syntax", "unresolved-import", "unbound-name")


class SettingsError(ValueError):
    """A setting that cannot be used. The message says where it stands, what is wrong with it and what is right."""


class Settings(NamedTuple):
    """How a project is to be read. Paths are absolute.

    `roots` are the folders of the program, `exclude` lines of an ignore file on top of those of .gitignore files,
    `diagnostics` the codes of the problems that are shown, `certainty` the least that an answer must have.
    `file` is where settings were found, None where nothing was.
    """

    roots: tuple[str, ...]
    exclude: tuple[str, ...] = ()
    environment: str | None = None
    version: tuple[int, int] | None = None
    diagnostics: frozenset[str] = frozenset(DIAGNOSTICS)
    certainty: Certainty = "by name"
    file: str | None = None

    def workspace(self, *, columns: Columns = "utf-8") -> Workspace:
        """A workspace of that. Raises as `Workspace` does."""
        return Workspace(
            *self.roots,
            exclude=self.exclude,
            environment=self.environment,
            version=self.version,
            columns=columns,
        )

    @property
    def admitted(self) -> tuple[Certainty, ...]:
        """What an answer may be to be sure enough to be shown."""
        return CERTAINTIES[: CERTAINTIES.index(self.certainty) + 1]

    def admits(self, certainty: str) -> bool:
        """Whether an answer is sure enough to be shown."""
        return certainty in self.admitted

    def updated(self, given: Mapping[str, Any], folder: str, source: str) -> Settings:
        """These with others in their place, by the names that the table has; paths count from `folder`.

        Raises `SettingsError`, whose message begins with `source`.
        """
        return _updated(self, given, folder, lambda key: f"{source}: {key}")


def load_settings(folder: str | os.PathLike[str]) -> Settings:
    """The settings for a folder: those of the nearest pyproject.toml in it or above it that has the table.

    Without one, or where it names no roots, the folder itself is the program. Raises `SettingsError`, `OSError` for a
    file that is there and cannot be read.
    """
    folder = os.path.abspath(folder)
    settings = Settings((folder,))
    for path in _project_files(folder):
        with open(path, "rb") as file:
            source = file.read()
        # Reading TOML takes longer than all else; most files do not have the table.
        if b"quillet" not in source:
            continue
        text = source.decode("utf-8-sig", "replace")
        table = _table(path, text)
        if table is None:
            continue
        found = settings._replace(file=path)
        return _updated(found, table, os.path.dirname(path), _PlaceIn(path, text))
    return settings


class _PlaceIn:
    """Where the keys of a file stand."""

    def __init__(self, path: str, text: str) -> None:
        self._path, self._text = path, text

    def __call__(self, key: str) -> str:
        return f"{self._path}:{_line_of(self._text, key)}: {key}"


def _project_files(folder: str) -> Iterable[str]:
    while True:
        path = os.path.join(folder, PROJECT_FILE)
        if os.path.isfile(path):
            yield path
        above = os.path.dirname(folder)
        if above == folder:
            return
        folder = above


def _table(path: str, text: str) -> dict[str, Any] | None:
    """The table of a file; None without one."""
    import re

    if sys.version_info >= (3, 11):
        import tomllib
    else:
        import tomli as tomllib
    try:
        content = tomllib.loads(text)
    except tomllib.TOMLDecodeError as error:
        place = re.search(r"\s*\(at (?:line (\d+), column \d+|end of document)\)$", str(error))
        said = str(error)[: place.start()] if place else str(error)
        line = int(place[1]) if place and place[1] else len(text.splitlines()) or 1
        raise SettingsError(f"{path}:{line}: {said}; it must be written as TOML") from error
    tool = content.get("tool")
    table = tool.get("quillet") if isinstance(tool, dict) else None
    if table is None:
        return None
    if not isinstance(table, dict):
        raise SettingsError(f"{path}:{_line_of(text, 'quillet')}: {TABLE} must be a table, written [{TABLE}]")
    return table


def _line_of(text: str, key: str) -> int:
    """The line on which a key of the table stands; that of the table where it is written in a way of its own."""
    import re

    header = re.compile(r"\s*\[\s*tool\s*\.\s*[\"']?quillet[\"']?\s*\]")
    plain = re.compile(rf"\s*[\"']?{re.escape(key)}[\"']?\s*=")
    dotted = re.compile(rf"\s*(?:tool\s*\.\s*)?quillet\s*\.\s*{re.escape(key)}\s*=")
    mentioned, is_inside = 1, False
    for number, line in enumerate(text.splitlines(), 1):
        if header.match(line):
            mentioned, is_inside = number, True
        elif line.lstrip().startswith("["):
            is_inside = False
        elif (is_inside and plain.match(line)) or dotted.match(line):
            return number
        elif mentioned == 1 and re.match(r"\s*(?:tool\s*\.\s*)?quillet\s*=", line):
            mentioned = number
    return mentioned


# ---- what each setting may be ----


class _Wrong(Exception):
    """What a setting has to be."""


def _updated(settings: Settings, given: Mapping[str, Any], folder: str, place: Callable[[str], str]) -> Settings:
    changes: dict[str, Any] = {}
    for key, value in given.items():
        read = _READERS.get(key)
        if read is None:
            raise SettingsError(f"{place(key)} is unknown; there are {', '.join(_READERS)}")
        try:
            changes[key] = read(value, folder)
        except _Wrong as wrong:
            raise SettingsError(f"{place(key)} {wrong}") from None
    return settings._replace(**changes)


def _is_texts(value: object) -> bool:
    return isinstance(value, (list, tuple)) and all(isinstance(item, str) and item for item in value)


def _absolute(path: str, folder: str) -> str:
    return os.path.normpath(os.path.join(folder, os.path.expanduser(path)))


def _roots(value: Any, folder: str) -> tuple[str, ...]:
    if not _is_texts(value) or not value:
        raise _Wrong('must be a list of folders, such as ["src", "tests"]')
    roots = tuple(_absolute(root, folder) for root in value)
    for root in roots:
        if not os.path.exists(root):
            raise _Wrong(f"names {root}, which is not there; it must name folders that are")
    return roots


def _exclude(value: Any, _: str) -> tuple[str, ...]:
    if not _is_texts(value) or any("\n" in pattern for pattern in value):
        raise _Wrong('must be a list of patterns as .gitignore files have them, such as ["build/", "*_pb2.py"]')
    return tuple(value)


def _environment(value: Any, folder: str) -> str:
    if not isinstance(value, str) or not value:
        raise _Wrong('must be the path of a virtual environment or an interpreter, such as ".venv"')
    path = _absolute(value, folder)
    if not os.path.exists(path):
        raise _Wrong(f"names {path}, which is not there; make the environment or leave the setting out")
    return path


def _version(value: Any, _: str) -> tuple[int, int]:
    major, _, minor = value.partition(".") if isinstance(value, str) else ("", "", "")
    if value != "2.7" and not (major == "3" and minor.isascii() and minor.isdigit() and len(minor) <= 2):
        raise _Wrong('must be a version in quotes, "2.7" or "3.x" such as "3.12"')
    return int(major), int(minor)


def _diagnostics(value: Any, _: str) -> frozenset[str]:
    if isinstance(value, bool):
        return frozenset(DIAGNOSTICS if value else ())
    if not _is_texts(value) or not set(value) <= set(DIAGNOSTICS):
        known = ", ".join(f'"{code}"' for code in DIAGNOSTICS)
        raise _Wrong(f"must be true, false, or a list of those to show, of {known}")
    return frozenset(value)


def _certainty(value: Any, _: str) -> str:
    if value not in CERTAINTIES:
        raise _Wrong(f"must be one of {', '.join(map(repr, CERTAINTIES))}")
    return str(value)


_READERS: dict[str, Callable[[Any, str], object]] = {
    "roots": _roots,
    "exclude": _exclude,
    "environment": _environment,
    "version": _version,
    "diagnostics": _diagnostics,
    "certainty": _certainty,
}
