"""What the statements of a file may not say to each other: blocks, clauses, and statements in their place.

Places and words are those of the newest interpreter; whether there is an error is asked of the one that runs.
"""

from __future__ import annotations

import random
import sys

import pytest

from quillet import analyze, analyze_files
from survey import Library, libraries
from syntax_agreement import answers_of

NEWEST = (3, 14)


def first_error(source: str, version: tuple[int, int] = NEWEST) -> str | None:
    """The class, the place and the words of the first error."""
    for line in analyze(source, version=version).errors:
        row, column = line.error_position or (0, 0)
        return f"{type(line.error).__name__} {row}:{column} {line.error.msg}"
    return None


INDENTATION = [
    ("  x = 1", "1:2 unexpected indent"),
    ("if x: pass\n  y", "2:2 unexpected indent"),
    ("x = (1,\n  2)\n  y", "3:2 unexpected indent"),
    ("@a\n  def f(): pass", "2:2 unexpected indent"),
    ("if x:\n    y\n  z", "3:4 unindent does not match any outer indentation level"),
    ("if x:\ny = 1", "2:1 expected an indented block after 'if' statement on line 1"),
    ("if x:", "1:6 expected an indented block after 'if' statement on line 1"),
    ("if x:\n y\nelse:\nz", "4:1 expected an indented block after 'else' statement on line 3"),
    ("for x in y:\n  # c\n\nz", "4:1 expected an indented block after 'for' statement on line 1"),
    ("class A(\n b):\nx", "3:1 expected an indented block after class definition on line 1"),
    ("async def f():\nx", "2:1 expected an indented block after function definition on line 1"),
    ("async def f():\n async with a:\n b", "3:2 expected an indented block after 'with' statement on line 2"),
    ("try:\n x\nexcept* A:\ny", "4:1 expected an indented block after 'except*' statement on line 3"),
    ("match a:\n  case b:\n  pass", "3:3 expected an indented block after 'case' statement on line 2"),
]
TABS = [
    ("if x:\n\ty\n        z", "3:1"),
    ("if x:\n        y\n\tz", "3:1"),
    ("if x:\n  \ty\n\tz", "3:1"),
]
SYNTAX = [
    ("try:\n  x\ny", "3:1 expected 'except' or 'finally' block"),
    ("try:\n  x", "2:4 expected 'except' or 'finally' block"),
    ("try: x\nelse: y\nfinally: z", "2:1 expected 'except' or 'finally' block"),
    ("else: pass", "1:1 invalid syntax"),
    ("elif x: pass", "1:1 invalid syntax"),
    ("with x: pass\nelse: pass", "2:1 invalid syntax"),
    ("if x: pass\nelse: pass\nelse: pass", "3:1 invalid syntax"),
    ("if x: pass\ny\nelse: pass", "3:1 invalid syntax"),
    ("while x: pass\nelif y: pass", "2:1 invalid syntax"),
    ("try: x\nfinally: y\nexcept: z", "3:1 invalid syntax"),
    ("try: x\nexcept: y\nelse: z\nexcept: w", "4:1 invalid syntax"),
    ("try: x\nexcept: y\nexcept E: z", "2:1 default 'except:' must be last"),
    ("try: x\nexcept* A: y\nexcept B: z", "3:1 cannot have both 'except' and 'except*' on the same 'try'"),
    ("match a:\n  x\n  case b: pass", "2:3 invalid syntax"),
    ("case x:\n  pass", "1:6 invalid syntax"),
    ("match x:\n case _: pass\n case y: pass", "2:7 wildcard makes remaining patterns unreachable"),
    ("match x:\n case (a): pass\n case y: pass", "2:8 name capture 'a' makes remaining patterns unreachable"),
    ("match x:\n case [_ | 1]: pass", "2:8 wildcard makes remaining patterns unreachable"),
    ("@a\nx = 1", "2:1 invalid syntax"),
    ("@a; b", "1:3 invalid syntax"),
    ("a; if b: c", "1:4 invalid syntax"),
    ("def f(): if x: pass", "1:10 invalid syntax"),
    ("break", "1:1 'break' outside loop"),
    ("if x: a; break", "1:10 'break' outside loop"),
    ("for x in y: pass\nelse: continue", "2:7 'continue' not properly in loop"),
    ("for x in y:\n def f():\n  break", "3:3 'break' outside loop"),
    ("for x in y:\n class C: continue", "2:11 'continue' not properly in loop"),
    (
        "while 1:\n try:\n  x\n except* A:\n  break",
        "5:3 'break', 'continue' and 'return' cannot appear in an except* block",
    ),
    (
        "def f():\n try:\n  x\n except* A:\n  return",
        "5:3 'break', 'continue' and 'return' cannot appear in an except* block",
    ),
    ("x\nfrom __future__ import division", "2:1 from __future__ imports must occur at the beginning of the file"),
    ("from __future__ import braces", "1:1 not a chance"),
    ("from __future__ import division, foo", "1:1 future feature foo is not defined"),
    ("if x: from __future__ import division", "1:7 from __future__ imports must occur at the beginning of the file"),
]
WRONG = [
    *((source, f"IndentationError {words}") for source, words in INDENTATION),
    *((source, f"TabError {place} inconsistent use of tabs and spaces in indentation") for source, place in TABS),
    *((source, f"SyntaxError {words}") for source, words in SYNTAX),
]
RIGHT = [
    "if x: pass\nelif y: pass\nelse: pass",
    "for x in y:\n if z: break\nelse: pass",
    "while x: a; continue",
    "while 1:\n try:\n  x\n except* A:\n  for y in z: break",
    "def f():\n try:\n  x\n except* A:\n  def g(): return",
    "try: x\nexcept A: y\nexcept: z\nelse: v\nfinally: w",
    "@a\n@b\nclass C: pass",
    "@a\n\n# c\nasync def f(): pass",
    "match x:\n case a if b: pass\n case 1 | _: pass",
    '"""doc"""\nfrom __future__ import division; from __future__ import annotations',
    "if x:\n\ty\n\tz",
    "if x:\n  y\n# c\n   # d\n  z",
    "if x:\n  y = '''\n'''\n  z",
    "def f(): x; return y",
    "if x: y; z\nelse: v",
    "class C:\n  x = 1\n\n\n  def f(self): pass\ny = 1",
    "x\\\n  = 1",
    "\ufeffif x:\n  y",
]


@pytest.mark.parametrize(("source", "expected"), WRONG, ids=[source for source, _ in WRONG])
def test_what_is_wrong_between_statements_is_told(source: str, expected: str) -> None:
    assert first_error(source + "\n") == expected


@pytest.mark.parametrize("source", RIGHT)
def test_what_is_right_is_not_complained_of(source: str) -> None:
    assert first_error(source + "\n") is None


@pytest.mark.parametrize("source", [source for source, _ in WRONG] + RIGHT)
@pytest.mark.skipif(sys.version_info < (3, 11), reason="the running interpreter knows less")
def test_the_running_interpreter_thinks_so_too(source: str) -> None:
    try:
        compile((source + "\n").encode(), "s", "exec")
    except SyntaxError:
        assert source not in RIGHT
    else:
        assert source in RIGHT


def test_versions_differ() -> None:
    continued = "while 1:\n try:\n  x\n finally:\n  continue\n"
    assert first_error(continued, (3, 7)) == "SyntaxError 5:3 'continue' not supported inside 'finally' clause"
    assert first_error(continued, (3, 8)) is None
    mixed = "if x:\n\ty\n        z\n"
    assert first_error(mixed, (2, 7)) is None
    assert "annotations is not defined" in str(first_error("from __future__ import annotations\n", (3, 6)))


def test_statements_keep_their_records() -> None:
    [line] = analyze("  x = a\n").errors
    assert [record.name for record in line.records] == ["x", "x", "a"]


def test_one_fault_is_told_once() -> None:
    # The head is rejected; its block is no second fault, and neither is the clause behind it.
    source = "if x y:\n    a\nelse:\n    b\ntry x:\n    c\nexcept:\n    d\n"
    assert [line.first_line for line in analyze(source).errors] == [1, 5]
    [error] = analyze("  def f(:\n    pass\n").errors
    assert isinstance(error.error, IndentationError)


def test_an_exact_reading_looks_at_statements_alone() -> None:
    for source, _ in INDENTATION:
        if "except*" not in source:
            assert analyze(source, exact=True).errors == []


def test_results_of_many_files_hold_them() -> None:
    [result] = analyze_files([("a.py", b"if x:\ny\n")], version=(3, 13))
    assert result.errors == [(2, 1, "expected an indented block after 'if' statement on line 1")]


# ---- names of a scope ----

LIBRARY = (3, 13)
#: Asked of every interpreter that is found: whether it takes them, and of the newest its words and places.
SCOPES = [
    "x = 1\nglobal x",
    "def f():\n print(x)\n global x",
    "def f(x):\n global x",
    "def f():\n x += 1\n global x",
    "def f():\n del x\n global x",
    "def f():\n import x\n global x",
    "def f():\n g = lambda: x\n global x",
    "def f():\n g = [y for y in x]\n global x",
    "def f():\n g = [x for y in z]\n global x",
    "def f():\n def g(): return x\n global x",
    "def f():\n def g(a=x): pass\n global x",
    "def f():\n @x\n def g(): pass\n global x",
    "def f():\n class x: pass\n global x",
    "def f():\n global x\n x = 1\n def x(): pass",
    "def f():\n if a: global x\n x = 1",
    "def f():\n x.y = 1\n global x",
    "def f():\n g(x=1)\n global x",
    "class A:\n def f(self):\n  __x\n  global __x",
    "class C:\n x = 1\n global x",
    "def f():\n nonlocal x",
    "x = 1\ndef f():\n nonlocal x",
    "class C:\n x = 1\n def f(self):\n  nonlocal x",
    "class C:\n def f(self):\n  nonlocal __class__",
    "def f():\n global x\n def g():\n  nonlocal x",
    "def f():\n def g():\n  nonlocal x\n x = 1",
    "def f():\n x = 1\n def g():\n  x = 2\n  nonlocal x",
    "def f():\n x = 1\n def g():\n  nonlocal x\n  global x",
    "def f(x):\n nonlocal x",
    "def f():\n yield 1\n return 2",
    "def f():\n return 2\n yield",
    "def f():\n x = lambda: (yield)\n return 2",
    "def f():\n yield\n def g(): return 1",
    "def f():\n from x import *",
    "def f():\n from x import *\n def g(): return y",
    "def f():\n from x import *\n def g(y): return y",
    "def f():\n x = 1\n del x\n def g(): x = 1",
    "def f():\n x = 1\n del x\n def g(): return x",
    *("\n".join(" " * i + "for x in y:" for i in range(n)) + "\n" + " " * n + "pass" for n in (20, 21, 22)),
    *("\n".join(" " * i + "if x:" for i in range(n)) + "\n" + " " * n + "pass" for n in (22,)),
    *("\n".join(" " * i + "with x, y:" for i in range(n)) + "\n" + " " * n + "pass" for n in (10, 11)),
]
SCOPES_OF_3_6 = [
    "def f():\n x: int\n global x",
    "def f():\n global x\n x: int = 1",
    "class C:\n global x\n x: int",
    "def f():\n print(f'{x}')\n global x",
    "async def f():\n yield 1\n return 2",
    "async def f():\n yield 1\n return",
    "async def f():\n return 2\n x = yield",
    "async def f():\n yield 1\n def g(): return 2",
]


@pytest.mark.parametrize("library", list(libraries().values()), ids=lambda library: library.name)
def test_names_are_used_as_each_interpreter_allows(library: Library) -> None:
    sources = [source + "\n" for source in SCOPES + (SCOPES_OF_3_6 if library.version >= (3, 6) else [])]
    answers = answers_of(library, sources)
    assert sum(answer is not None for answer in answers) > 8
    for source, answer in zip(sources, answers, strict=True):
        found = first_error(source, library.version)
        assert (found is None) == (answer is None), source
        if answer is not None and library.version == LIBRARY and "with" not in source:
            assert found == f"{answer[0]} {answer[2]}:{answer[3]} {answer[1]}", source


#: Heads and statements that bind, use and declare `x` and `y`.
HEADS_OF_SCOPES = [
    "def f():",
    "def f(x):",
    "def x():",
    "def f(y, *x):",
    "def f(y=x):",
    "async def f():",
    "class C:",
    "class x:",
]
USES = (
    "x = 1|y = x|y = x = 2|global x|global y, x|nonlocal x|nonlocal y|import x|x: int = 1|x: int|a.x = 1|f(x=1)|f'{x}'|"
    "z = lambda: x|z = [x for y in z]|for x in y: pass|with y as x: pass|if y: global x|del x|x += 1|x, y = z|yield 1|"
    "return|return 2|await y|pass"
).split("|")


def scopes(draw: random.Random, depth: int = 0) -> list[str]:
    """Functions and classes in each other, at random."""
    rows = list[str]()
    for _ in range(draw.randint(1, 4)):
        if depth < 4 and draw.random() < 0.35:
            rows.append(" " * depth + draw.choice(HEADS_OF_SCOPES))
            rows += scopes(draw, depth + 1)
        else:
            rows.append(" " * depth + draw.choice(USES))
    return rows


@pytest.mark.skipif(sys.version_info < (3, 8), reason="what 3.6 and 3.7 do not see is not seen")
def test_names_in_random_scopes_are_used_as_the_interpreter_allows() -> None:
    verdicts = set[bool]()
    for seed in range(2000):
        source = "\n".join(scopes(random.Random(seed))) + "\n"
        try:
            compile(source, "scopes.py", "exec")
            is_valid = True
        except SyntaxError:
            is_valid = False
        assert (first_error(source, sys.version_info[:2]) is None) == is_valid, source
        verdicts.add(is_valid)
    assert len(verdicts) == 2


def test_what_is_wrong_with_a_name_leaves_the_records() -> None:
    lines = analyze("def f():\n x = a\n global x\n", version=NEWEST).lines
    assert lines[2].error is not None
    assert [record.name for record in lines[2].records] == ["x"]
