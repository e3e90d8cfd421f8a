"""`quillet analyze`: files in, what their statements say out.

Data goes to stdout, everything about the run to stderr. A file that cannot be read is named and
counted, and the others are still served. A reader that goes away ends the run without a word.
"""

from __future__ import annotations

import logging
import sys
from collections.abc import Iterable, Iterator
from contextlib import contextmanager

import click

from quillet._source import SourceEncodingError
from quillet.cli.files import Found, find_files, problem_of, read_file
from quillet.cli.output import JsonWriter, TextWriter, Writer
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.host import analyze, language_version


def run(
    paths: tuple[str, ...],
    *,
    form: str,
    version: tuple[int, int] | None,
    errors_only: bool,
    strict: bool,
    gitignore: bool,
    stdin_filename: str,
) -> int:
    """Runs the command and returns its exit code."""
    writer: Writer
    if form == "jsonl":
        writer = JsonWriter(errors_only=errors_only, version=language_version(version))
    else:
        writer = TextWriter(errors_only=errors_only, style=Style.of_stdout())

    unread = 0
    errors = 0
    reports = _Reports()
    logging.getLogger("quillet").addHandler(reports)
    with quiet_output() as out:
        out.write(writer.header())
        with _progress(find_files(paths, gitignore=gitignore)) as found:
            for item in found:
                reports.path = item.path
                try:
                    source = _read(item)
                    analysis = analyze(source, version=version)
                except (_Unreadable, SourceEncodingError) as problem:
                    unread += 1
                    # The lines before it come first where both streams go to one place.
                    out.flush()
                    print(f"quillet: {printable(item.path)}: {printable(str(problem))}", file=sys.stderr)
                    continue
                errors += len(analysis.errors)
                out.write(writer.file(stdin_filename if item.path == "-" else item.path, analysis))
    if unread:
        print(f"quillet: {unread} {'file' if unread == 1 else 'files'} could not be read", file=sys.stderr)
    return 1 if unread or (strict and errors) else 0


class _Reports(logging.Handler):
    """Names the file in which a statement was given up, and why, in one line."""

    path = ""

    def emit(self, record: logging.LogRecord) -> None:
        reason = record.exc_info[1] if record.exc_info else record.getMessage()
        first_line = str(reason).partition("\n")[0]
        print(f"quillet: {printable(self.path)}: {printable(first_line)}", file=sys.stderr)


class _Unreadable(Exception):
    """A file that could not be read; the text is the reason."""


def _read(item: Found) -> bytes:
    if item.problem is not None:
        raise _Unreadable(item.problem)
    if item.path == "-":
        return sys.stdin.buffer.read()
    try:
        return read_file(item.path)
    except OSError as error:
        raise _Unreadable(problem_of(error)) from error
    except ValueError as error:  # a NUL in the name
        raise _Unreadable(str(error)) from error


@contextmanager
def _progress(found: Iterator[Found]) -> Iterator[Iterable[Found]]:
    """The files, with a bar on stderr while they are worked through.

    The bar is for a person who waits: without a terminal, or where the data itself runs over it, there
    is none.
    """
    if not sys.stderr.isatty() or sys.stdout.isatty():
        yield found
        return
    files = list(found)
    with click.progressbar(files, label="analysing", show_pos=True, file=sys.stderr) as bar:
        yield bar
