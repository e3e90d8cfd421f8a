"""`quillet analyze`: files in, what their statements say out.

The core reads, analyses and writes on all cores; what is left here is to find the files and to pass on
what was written, file by file in their order. Data goes to stdout, everything about the run to stderr.
A file that cannot be read is named and counted, and the others are still served. A reader that goes
away ends the run without a word.
"""

from __future__ import annotations

import os
from contextlib import closing
from typing import TextIO

from quillet._batch import BatchInput, write_files
from quillet.cli.files import Found, find_files, problem_of, read_file
from quillet.cli.output import output_format, output_header
from quillet.cli.progress import Progress, is_terminal, say
from quillet.cli.show import printable
from quillet.cli.streams import bytes_writer, quiet_output


def run(
    paths: tuple[str, ...],
    *,
    form: str,
    version: tuple[int, int] | None,
    errors_only: bool,
    strict: bool,
    gitignore: bool,
    exclude: tuple[str, ...],
    stdin_filename: str,
    jobs: int | None,
    exact: bool = False,
) -> int:
    """Runs the command and returns its exit code."""
    unread = 0
    errors = 0
    with quiet_output() as out:
        write = bytes_writer(out)
        write(memoryview(output_header(form, version)))
        found = list(find_files(paths, gitignore=gitignore, exclude=exclude))
        inputs = [_input_of(item, stdin_filename) for item in found]
        results = write_files(inputs, version=version, jobs=jobs, form=output_format(form, errors_only), exact=exact)
        # The line is for a person who waits: where the data itself runs over the terminal, there is none.
        with closing(results), Progress("analysing", len(found), wanted=not is_terminal(out)) as progress:
            for result in results:
                path = found[result.index].path
                if result.problem is not None:
                    unread += 1
                    _complain(out, path, result.problem)
                for line, _, message in result.reports:
                    _complain(out, path, message, line)
                errors += len(result.errors)
                write(memoryview(result))
                progress.advance()
    if unread:
        say(f"{unread} {'file' if unread == 1 else 'files'} could not be read")
    return 1 if unread or (strict and errors) else 0


def _input_of(item: Found, stdin_filename: str) -> BatchInput:
    if item.path == "-" and item.problem is None:
        try:
            return os.fsencode(stdin_filename), read_file("-"), None
        except OSError as error:
            item = Found(stdin_filename, problem_of(error))
    problem = item.problem.encode("utf-8", "backslashreplace") if item.problem is not None else None
    return os.fsencode(item.path), None, problem


def _complain(out: TextIO, path: str, reason: str, line: int | None = None) -> None:
    # The lines before it come first where both streams go to one place.
    out.flush()
    first_line = reason.partition("\n")[0]
    place = printable(path) if line is None else f"{printable(path)}:{line}"
    say(f"{place}: {printable(first_line)}")
