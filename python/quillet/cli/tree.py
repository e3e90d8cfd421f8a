"""`quillet tree`: the parse trees of a file, or of the one statement that stands on a line."""

from __future__ import annotations

import os
import re
import sys

from quillet._source import SourceEncodingError
from quillet._trees import tree_text
from quillet.cli.files import problem_of, read_file
from quillet.cli.show import Style, error_text, printable, statement_text
from quillet.cli.streams import quiet_output
from quillet.host import Analysis, Line, analyze


def run(target: str, *, version: tuple[int, int] | None, stdin_filename: str) -> int:
    """Runs the command and returns its exit code."""
    path, number = split_target(target)
    shown = stdin_filename if path == "-" else path
    try:
        analysis = analyze(read_file(path), version=version, exact=True)
    except OSError as error:
        return _fail(path, problem_of(error))
    except SourceEncodingError as error:
        return _fail(path, str(error))

    lines = [line for line in analysis.lines if number is None or line.first_line <= number <= line.last_line]
    if not lines:
        print(f"quillet: {printable(shown)}: there is no line {number}", file=sys.stderr)
        return 2
    style = Style.of_stdout()
    with quiet_output() as out:
        for line in lines:
            out.write(_line_text(shown, analysis, line, style))
    return 0


def split_target(target: str) -> tuple[str, int | None]:
    """FILE and LINE of an argument. FILE:LINE:COLUMN is taken too, as errors are shown that way."""
    if not os.path.exists(target):
        match = re.fullmatch(r"(.+?):([0-9]{1,9})(?::[0-9]*)?:?", target, re.DOTALL)
        if match is not None:
            return match[1], int(match[2])
    return target, None


def _line_text(path: str, analysis: Analysis, line: Line, style: Style) -> str:
    try:
        tree = tree_text(line, analysis.analyzer)
    except SyntaxError as error:
        row = line.first_line + (error.lineno or 1) - 1
        column = max(error.offset or 1, 1)
        return error_text(path, analysis, row, column, error.msg, style)
    if not tree:
        return ""
    body = "".join(f"    {printable(row)}\n" for row in tree.splitlines())
    return statement_text(path, analysis, line, style) + body


def _fail(path: str, reason: str) -> int:
    print(f"quillet: {printable(path)}: {printable(reason)}", file=sys.stderr)
    return 1
