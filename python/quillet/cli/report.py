"""`quillet report`: files and folders as a static site."""

from __future__ import annotations

import os

from quillet.cli.files import find_files, pipe_problem, problem_of
from quillet.cli.progress import Progress, say
from quillet.cli.show import printable
from quillet.report.folder import SiteProblem
from quillet.report.site import Reports, Settings, Source, write_site


def run(paths: tuple[str, ...], folder: str, settings: Settings, *, gitignore: bool, exclude: tuple[str, ...]) -> int:
    """Runs the command and returns its exit code."""
    paths = paths or (".",)
    if "-" in paths or "" in paths:
        say("standard input and empty paths have no place in a report; name files or folders")
        return 2
    try:
        sources, lost = _sources(paths, gitignore, exclude)
        if not sources:
            say(f"{' '.join(map(printable, paths))}: there are no Python files; name a folder that holds some")
            return 2
        with Progress("reading", len(sources)) as progress:
            reports = Reports(unread=_say_of, cut=_say_of, begin=progress.begin, advance=progress.advance)
            lost += write_site(sources, folder, settings, reports)
    except KeyboardInterrupt:
        return 130
    except SiteProblem as problem:
        say(printable(str(problem)))
        return 2
    except OSError as error:
        say(f"{printable(folder)}: {printable(problem_of(error))}")
        return 2
    count = f"{len(sources)} {'file' if len(sources) == 1 else 'files'}"
    say(f"{count}; open {printable(os.path.join(folder, 'index.html'))}")
    return 1 if lost else 0


def _sources(paths: tuple[str, ...], gitignore: bool, exclude: tuple[str, ...]) -> tuple[list[Source], int]:
    """The files to show, each once, and how many cannot be."""
    sources: dict[str, Source] = {}
    lost = 0
    for found in find_files(paths, gitignore=gitignore, exclude=exclude):
        problem = found.problem or _pipe_problem(found.path)
        if problem is not None:
            _say_of(found.path, problem)
            lost += 1
            continue
        name = _name_of(found.path)
        sources.setdefault(name, Source(found.path, name))
    return sorted(sources.values(), key=lambda source: _parts(source.name)), lost


def _pipe_problem(path: str) -> str | None:
    """Of a path that is named; one that cannot be looked at says so where it is read."""
    try:
        return pipe_problem(os.stat(path).st_mode)
    except (OSError, ValueError):
        return None


def _name_of(path: str) -> str:
    """The path below the working folder where it stands there, and otherwise as it was given."""
    name = os.path.normpath(path)
    if os.path.isabs(name):
        here = os.getcwd()
        if os.path.commonpath((name, here)) == here:
            name = os.path.relpath(name, here)
    return os.fsencode(name).decode("utf-8", "backslashreplace").replace(os.sep, "/")


def _parts(name: str) -> tuple[tuple[bool, str], ...]:
    """What sorts the files of a folder in front of its folders."""
    *folders, file = name.split("/")
    return (*((True, folder) for folder in folders), (False, file))


def _say_of(path: str, problem: str) -> None:
    first_line = problem.partition("\n")[0]
    say(f"{printable(path)}: {printable(first_line)}")
