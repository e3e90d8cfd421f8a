"""Syntax errors beside those of Python: whole libraries, and statements that were broken on purpose.

Each interpreter that is found is asked to compile its own library, with its tests, and statements of that library
with tokens dropped, doubled, exchanged and replaced, each where it may stand (`return` in a function, `else` behind
an `if`). quillet reads the same text as the same version. There is a difference where one of the two has an error and
the other has none; every difference has a cause that is known here, or it is a fault.

Run as a command it prints the tables of docs/agreement.md:

    python tests/python/syntax_agreement.py [--python 3.12] [--mutated 200000] [--each-nth 1] [--show 20]

Places and words are compared with those of the newest interpreter.
"""

from __future__ import annotations

import argparse
import json
import random
import re
import subprocess
import sys
import tempfile
from collections import Counter
from collections.abc import Iterator, Sequence
from dataclasses import dataclass, field
from pathlib import Path

if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).resolve().parent.parent.parent / "scripts"))

from quillet import Analysis, Line, SourceEncodingError, analyze
from survey import NO_STATEMENT, Library, libraries

# Compiles the sources of a JSON file one by one. Old Pythons run it, too.
_COMPILER = """
import json, sys, warnings
warnings.simplefilter("ignore")
with open(sys.argv[1]) as file:
    sources = json.load(file)
answers = []
for source in sources:
    try:
        compile(source.encode("utf-8"), "s", "exec", 0, 1)
        answers.append(None)
    except SyntaxError as error:
        answers.append([type(error).__name__, error.msg, error.lineno or 0, error.offset or 0])
    except Exception as error:
        answers.append([type(error).__name__, "", 0, 0])
with open(sys.argv[2], "w") as file:
    json.dump(answers, file)
"""

#: What no reader of a source can know.
BEYOND = re.compile(r"unknown Unicode character name|'ascii' codec|unknown encoding|encoding problem")
#: An interpreter that gives up.
OTHER_KINDS = {"MemoryError", "RecursionError", "OverflowError", "ValueError", "SystemError"}
#: What quillet says of hints, which Python does not read.
OF_HINTS = re.compile(r"invalid syntax in (stringified type hint|commented type hint|signature comment)")

CODING = re.compile(r"\A.*(\n.*)?coding[:=]")
UTF8 = re.compile(r"\A.*(\n.*)?coding[:=] *utf-?8", re.IGNORECASE)

TOKEN = re.compile(
    r"\w+|(?:[rbuf]{0,2})'[^'\n]*'|(?:[rbuf]{0,2})\"[^\"\n]*\"|\*\*=?|//=?|>>=?|<<=?|->|:=|[-+*/%&|^@<>=!]=|\.\.\.|[^\s\w]"
)
PIECES = """
( ) [ ] { } , : . = ; * ** | -> := @ - + ... ~ ` <> != == -= >>= 'x' b'x' f'{x}' 0 1 .5 2j 0777 1_0 x y _ a.b f(x) x[0]
(x) [x] (x,y) match case type with as async await except def class if else elif lambda for in not is yield from import
print exec None True del try return pass global nonlocal while and or
""".split()

#: Words whose statements are of use only with another statement around them, or behind them.
PARTNERS = {"elif", "else", "except", "finally", "try", "case", "match", "@", "if", "for", "while", "with"}


@dataclass
class Statement:
    """A statement of a library, and where it stands."""

    text: str
    first: str
    place: str  # "module", "class", "def" or "async def"


def statements_of(path: Path, version: tuple[int, int]) -> Iterator[Statement]:
    """The statements of a file."""
    try:
        analysis = analyze(path.read_bytes(), version=version)
    except SourceEncodingError:
        return
    source = analysis.source
    if not source.isascii():
        return
    physical = source.decode().splitlines(keepends=True)
    places: list[tuple[int, str]] = []
    for line in analysis.lines:
        logical = line.logical
        if logical.fType in NO_STATEMENT or line.error is not None or not logical.fToks:
            continue
        while places and places[-1][0] >= line.indent:
            places.pop()
        place = places[-1][1] if places else "module"
        toks = [token for token in logical.fToks if token]
        if toks[0] in ("def", "class") or toks[:2] == ["async", "def"]:
            places.append((line.indent, " ".join(toks[:2]) if toks[0] == "async" else toks[0]))
        text = text_of(line, physical)
        if text and len(text) < 400 and "\\\n" not in text:
            yield Statement(text, toks[0], place)


def text_of(line: Line, physical: Sequence[str]) -> str:
    """The bytes of a statement from its first to its last token, without comments at the end."""
    logical = line.logical
    last = max((i for i, token in enumerate(logical.fToks) if token and token[0] != "#"), default=-1)
    if last < 0:
        return ""
    (first_row, first_column), (last_row, last_column) = logical.fPositions[0], logical.fPositions[last]
    base = line.first_line - 1
    rows = list(physical[base + first_row : base + last_row + 1])
    if not rows:
        return ""
    token = logical.fToks[last]
    if "\n" in token:
        return ""
    rows[-1] = rows[-1][: last_column + len(token)]
    rows[0] = rows[0][first_column:]
    return "".join(rows)


def wrapped(statement: Statement, text: str, version: tuple[int, int]) -> str:
    """A source in which the statement may stand, with what has to stand around it."""
    head = {"module": "", "class": "class C:\n", "def": "def f(self):\n", "async def": "async def f(self):\n"}[
        statement.place
    ]
    blank = " " if head else ""
    text = text.strip()
    if text.endswith(":") and statement.first not in ("match", "@"):
        text += " pass"
    first = statement.first
    front, behind = "", ""
    if first in ("elif", "else"):
        front = f"{blank}if x: pass\n"
    elif first in ("except", "finally"):
        front = f"{blank}try: pass\n"
    elif first == "try":
        behind = f"{blank}finally: pass\n"
    elif first == "@":
        behind = f"{blank}def g(): pass\n"
    elif first == "case":
        front, blank = f"{blank}match 0:\n", blank + " "
    elif first == "match" and text.endswith(":"):
        behind = f"{blank} case 0: pass\n"
    return f"{head}{front}{blank}{text}\n{behind}"


def broken(draw: random.Random, statement: Statement, other: Statement) -> str:
    """The text with up to three tokens changed."""
    spans = [match.span() for match in TOKEN.finditer(statement.text)]
    fixed = 1 if statement.first in PARTNERS or statement.first == "async" else 0
    for _ in range(draw.choice((1, 1, 1, 2, 3))):
        if len(spans) <= fixed:
            break
        text = statement.text
        at = draw.randrange(fixed, len(spans))
        begin, end = spans[at]
        kind = draw.randrange(5)
        if kind == 0:
            text = text[:begin] + text[end:]
        elif kind == 1:
            text = text[:end] + " " + text[begin:end] + text[end:]
        elif kind == 2:
            text = text[:begin] + " " + draw.choice(PIECES) + " " + text[end:]
        elif kind == 3:
            text = text[:begin] + " " + draw.choice(PIECES) + " " + text[begin:]
        else:
            pieces = TOKEN.findall(other.text)
            text = text[:begin] + " " + draw.choice(pieces or ["x"]) + " " + text[end:]
        statement = Statement(text, statement.first, statement.place)
        spans = [match.span() for match in TOKEN.finditer(text)]
    return statement.text


def answers_of(library: Library, sources: Sequence[str]) -> list[list[object] | None]:
    """What the interpreter says of each source: nothing, or class, message, line and offset."""
    with tempfile.TemporaryDirectory() as folder:
        question, answer = Path(folder, "sources.json"), Path(folder, "answers.json")
        question.write_text(json.dumps(sources))
        subprocess.run(
            [library.executable, "-c", _COMPILER, str(question), str(answer)], check=True, stderr=subprocess.DEVNULL
        )
        return json.loads(answer.read_text())


@dataclass
class SyntaxReport:
    """The comparison with one interpreter."""

    sources: int = 0
    agreeing: int = 0
    errors: int = 0
    places: int = 0
    words: int = 0
    beyond: Counter[str] = field(default_factory=Counter)
    overlooked: Counter[str] = field(default_factory=Counter)  # by what Python says
    invented: Counter[str] = field(default_factory=Counter)  # by what quillet says
    examples: dict[str, list[str]] = field(default_factory=dict)
    other_places: Counter[str] = field(default_factory=Counter)

    def compare(self, source: str, answer: list[object] | None, analysis: Analysis) -> None:
        errors = [line for line in analysis.errors if line.error and not OF_HINTS.search(line.error.msg)]
        if answer is not None and (answer[0] in OTHER_KINDS or BEYOND.search(str(answer[1]))):
            self.beyond[str(answer[0]) if answer[0] in OTHER_KINDS else str(answer[1])] += 1
            return
        self.sources += 1
        if bool(errors) != (answer is not None):
            if answer is None:
                error = errors[0].error
                assert error is not None
                self._differ(self.invented, f"quillet: {error.msg}", source)
            else:
                self._differ(self.overlooked, f"python: {answer[1]}", source)
            return
        self.agreeing += 1
        if answer is None:
            return
        self.errors += 1
        position = errors[0].error_position
        error = errors[0].error
        assert error is not None
        same_place = position == (answer[2], answer[3])
        same_words = error.msg == answer[1]
        self.places += same_place
        self.words += same_words
        if not same_place or not same_words:
            self._differ(
                self.other_places,
                f"{'' if same_place else 'place '}{'' if same_words else 'words '}| {answer[1]} | {error.msg}",
                f"{source}    # python {answer[2]}:{answer[3]}, quillet {position}",
            )

    def _differ(self, counter: Counter[str], why: str, source: str) -> None:
        why = re.sub(r"(argument repeated:|argument|attribute name repeated in class pattern:) \S+", r"\1 NAME", why)
        counter[why] += 1
        self.examples.setdefault(why, []).append(source)


def mutated_sources(library: Library, count: int, each_nth: int, seed: int = 7) -> list[str]:
    """Broken statements of a library, where they may stand."""
    draw = random.Random(seed)
    statements = [s for path in library.files(each_nth) for s in statements_of(path, library.version)]
    rare = [
        s
        for s in statements
        if s.first in PARTNERS | {"async", "def", "class", "del", "lambda", "from", "type", "yield"}
    ]
    sources = []
    while len(sources) < count:
        statement = draw.choice(rare if rare and draw.random() < 0.3 else statements)
        text = broken(draw, statement, draw.choice(statements))
        if "\f" in text or "\t" in text:
            continue
        words = TOKEN.findall(text)
        # A clause without what it is a clause of is for no statement alone to see.
        if not words or words[0] == "#" or (words[0] != statement.first and {words[0], statement.first} & PARTNERS):
            continue
        if statement.first == "case" and not text.endswith(":") and ":" not in words:
            continue
        sources.append(wrapped(statement, text, library.version))
    return sources


def compare(library: Library, sources: Sequence[str]) -> SyntaxReport:
    report = SyntaxReport()
    for start in range(0, len(sources), 5000):
        part = sources[start : start + 5000]
        for source, answer in zip(part, answers_of(library, part), strict=True):
            report.compare(source, answer, analyze(source, version=library.version))
    return report


def library_sources(library: Library, each_nth: int) -> list[str]:
    """The files of a library, those that any reader takes for text."""
    sources = []
    for path in library.files(each_nth):
        try:
            text = path.read_bytes().decode("utf-8")
        except UnicodeDecodeError:
            continue
        # What another encoding makes of it is for whoever decodes it.
        if not text.isascii() and CODING.search(text) and not UTF8.search(text):
            continue
        sources.append(text)
    return sources


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--python", action="append", help="only of this version")
    parser.add_argument("--mutated", type=int, default=200_000)
    parser.add_argument("--each-nth", type=int, default=1)
    parser.add_argument("--show", type=int, default=12)
    parser.add_argument("--no-library", action="store_true")
    parser.add_argument("--words", action="store_true", help="show where places and words differ")
    arguments = parser.parse_args()
    for version, library in libraries().items():
        if arguments.python and ".".join(map(str, version)) not in arguments.python:
            continue
        parts = [("mutated", mutated_sources(library, arguments.mutated, arguments.each_nth))]
        if not arguments.no_library:
            parts.insert(0, ("library", library_sources(library, arguments.each_nth)))
        for title, sources in parts:
            report = compare(library, sources)
            print(
                f"{library.name} {title}: {report.sources:,} sources, {report.agreeing:,} agree "
                f"({report.agreeing / max(report.sources, 1):.4%}); of {report.errors:,} errors "
                f"{report.places / max(report.errors, 1):.1%} in their place, "
                f"{report.words / max(report.errors, 1):.1%} in the words; beyond {report.beyond.total():,}; "
                f"overlooked {report.overlooked.total():,}, invented {report.invented.total():,}"
            )
            counters = [report.overlooked, report.invented] + ([report.other_places] if arguments.words else [])
            for counter in counters:
                for why, count in counter.most_common(arguments.show):
                    print(f"   {count:6} {why}")
                    for example in report.examples[why][:3]:
                        print("          ", repr(example[-160:] if title == "library" else example))


if __name__ == "__main__":
    main()
