#!/usr/bin/env python3
"""Writes docs/man/quillet.1 from the help texts of the command line, or checks that it is theirs.

scripts/man_page.py            exit code 1 where the page is stale
scripts/man_page.py --write    rewrites it
"""

from __future__ import annotations

import sys
from pathlib import Path

import click

from quillet.cli.commands import group as command_line

PAGE = Path(__file__).resolve().parent.parent / "docs" / "man" / "quillet.1"


def escape(text: str) -> str:
    """Text that means nothing to the formatter."""
    escaped = text.replace("\\", "\\e").replace("-", "\\-")
    return "\\&" + escaped if escaped.startswith((".", "'")) else escaped


def help_of(text: str) -> list[str]:
    """A help text: paragraphs, and examples as they are."""
    out = []
    for paragraph in text.split("\n\n"):
        lines = paragraph.strip("\n").split("\n")
        if lines[0].strip() == "\b":
            out += [".PP", ".nf", *(escape(line) for line in lines[1:]), ".fi"]
        else:
            out += [".PP", *(escape(line.strip()) for line in lines if line.strip())]
    return out


def options_of(command: click.Command) -> list[str]:
    """The options of a command, a tagged paragraph each."""
    context = click.Context(command, info_name=command.name)
    out = []
    for parameter in command.params:
        record = parameter.get_help_record(context)
        if record is not None:
            out += [".TP", f".B {escape(record[0])}", escape(record[1])]
    return out


def page() -> str:
    """The whole page."""
    out = ['.TH QUILLET 1 "" "quillet" "User Commands"', ".SH NAME"]
    out += [f"quillet \\- {escape((command_line.help or '').rstrip('.').lower())}", ".SH SYNOPSIS"]
    out += [".B quillet", "\\fICOMMAND\\fR [\\fIOPTION\\fR]... [\\fIARGUMENT\\fR]...", ".SH COMMANDS"]
    for name, command in sorted(command_line.commands.items()):
        usage = " ".join(command.collect_usage_pieces(click.Context(command, info_name=name)))
        out += [f".SS quillet {escape(name)} {escape(usage)}", *help_of(command.help or ""), *options_of(command)]
    out += [".SH EXIT STATUS", "0 for success. 1 where a file could not be read, or a question found nothing."]
    out += ["2 for wrong usage, or a question to an index that cannot be used.", ".SH FILES", ".TP"]
    out += [".B .quillet\\-index", "The index of the working folder or the nearest one above."]
    return "\n".join(out) + "\n"


def main() -> int:
    """Runs the command."""
    if "--write" in sys.argv[1:]:
        PAGE.write_text(page(), encoding="utf-8")
        return 0
    if not PAGE.exists() or PAGE.read_text(encoding="utf-8") != page():
        print("docs/man/quillet.1 is stale; scripts/man_page.py --write rewrites it")
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main())
