"""The complete reading: what `quillet.analyze` reads beyond, and otherwise than, an exact one.

Statements that the tables reject have their records, comments that are no types are no errors, what concerns a
hint stays with the hint, and what a version does not take is rejected in Python's own words.
"""

from __future__ import annotations

import pytest

from quillet import analyze, analyze_files

NEWEST = (3, 14)


def around(source: str) -> tuple[str, str]:
    """What has to stand in front of a statement or a head, and behind it, for a file without an error of its own."""
    front = ""
    if source.startswith("case "):
        front = "match 0:\n "
    elif source.startswith("except"):
        front = "try: pass\n"
    code = source.split("#")[0].rstrip()
    behind = "\ndef g(): pass\n" if source.startswith("@") else "\n"
    if code.endswith(":"):
        behind = "\n  case 0: pass\n" if source.startswith("match ") else "\n  pass\n"
    return front, behind


def read(source: str, version: tuple[int, int] = NEWEST, *, exact: bool = False) -> list[str]:
    """The records of all lines of a source, each as a line of text, and errors as place and message."""
    front, behind = around(source)
    lines_in_front = front.count("\n")
    last_line = lines_in_front + source.count("\n") + 1
    found = []
    for line in analyze(front + source + behind, version=version, exact=exact).lines:
        if not lines_in_front < line.first_line <= last_line:
            continue
        if line.error is not None:
            row, column = line.error_position or (0, 0)
            found.append(f"{row - lines_in_front}:{column} {line.error.msg}")
        for record in line.records:
            mark = "parameter " if record.is_parameter else ""
            found.append(f"{record.name} {mark}{record.kind.value} {record.detail}".rstrip())
    return found


# ---- statements that the tables reject ----

FORMS = [
    ("case a, *rest:", ["a set", "rest set"]),
    ("case (1 as z):", ["z set"]),
    ("case (a.b | c.d):", None),
    ("case ():", []),
    ('case "GET" "/":', []),
    ("case (Point(x=y) | [_, y]) as whole if y:", ["y set", "y set", "whole set", "Point get", "y get"]),
    ("case {-1: x, 'k': a.b, **rest}:", ["x set", "rest set", "a get", "a.b get"]),
    ("case x:", ["x set"]),
    ("case a.b:", ["a get", "a.b get"]),
    ("case _:", []),
    ("match ...:", []),
    ("match *a, b:", ["a get", "b get"]),
    ("@buttons[0].clicked", ["buttons get", "buttons[0].clicked get"]),
    ("@f(x)(y)", ["f called (x)", "f get", "x get", "y get"]),
    ("@a or b", ["a get", "b get"]),
    ("with (found := find(key)):", ["found set", "found equal find(key)", "find called (key)", "find get", "key get"]),
    ("with (a / b).c:", None),
    ("with (open(a) as f, g,): pass", None),
    ("def f(*args: *Ts): pass", None),
    ("class C[T: int = str, *Ts = *tuple[int]]: pass", None),
    ("type X[T] = list[T]", ["X set", "X equal list[T]", "list get", "T get", "T parameter type_parameter"]),
    ("except A, B:", ["A get", "B get"]),
    ("except* (A, B) as e:", None),
    ("x = {a := 1, b}", None),
    ('x = t"{name!r:>{width}}" rt"{b.c}"', ["x set", "name get", "width get", "b get", "b.c get"]),
    ('x = t"{d["a"]}{e}"', ["x set", "d get", "e get"]),
    ('x = t"""{d["a"]:{w}}""" rt"\\d{e["}"]}"', ["x set", "d get", "w get", "e get"]),
    ("x[a := 1]", None),
    ("f(x := y for z in w)", None),
    ("x: ...", ["x hint ..."]),
    ("def f() -> ...: pass", ["f set", "return parameter hint ..."]),
    ("(x) = 1", ["x set", "x literal int: 1"]),
    ("[(x), y] = z", ["x set", "x equal z[0]", "y set", "y equal z[1]", "z get"]),
    ("a, *[b, c] = d", ["a set", "a equal d[0]", "b set", "c set", "d get"]),
    ("x = micros // 10 ** 6", ["x set", "x expression micros // 10 ** 6", "micros get"]),
    ("x = a ** b", ["x set", "x expression a ** b", "a get", "b get"]),
    ("d.setdefault(K, {})[k] = v", None),
    ("with f() as x.y: pass", ["x.y set", "x.y equal f()", "x get", "f get"]),
    ("x = " + "f(" * 60 + "a" + ")" * 60, None),
]


@pytest.mark.parametrize(("source", "expected"), FORMS, ids=[form[0][:50] for form in FORMS])
def test_every_form_of_the_newest_version_is_read(source: str, expected: list[str] | None) -> None:
    found = read(source)
    assert [text for text in found if text[0].isdigit()] == []
    if expected is None:
        assert any(text.endswith(" get") or " get" in text for text in found)
    else:
        assert found == expected


def test_what_a_target_reads_is_read() -> None:
    assert "K get" in read("d.setdefault(K, {})[k] = v")
    assert "K get" not in read("d.setdefault(K, {})[k] = v", exact=True)


def test_2_binds_all_names_of_an_except() -> None:
    assert read("except E, (a, b):", (2, 7)) == ["a set", "b set", "E get"]
    assert read("print >>f, x,", (2, 7)) == ["f get", "x get"]


# ---- comments and hints ----

HINTS = [
    ("x = 1  # type: ignore[misc]", ["x set", "x literal int: 1"]),
    ("x = 1  # type: ignore # why", ["x set", "x literal int: 1"]),
    ("def f(a):  # type: ignore[override]", ["f set", "a parameter set"]),
    ("x = 1  # type: any text", ["1:20 invalid syntax in commented type hint", "x set", "x literal int: 1"]),
    ("def f(a):  # type: int", ["1:20 invalid syntax in signature comment", "f set", "a parameter set"]),
    (
        "def f(*a, **k):  # type: (*str, **int) -> (None)",
        [
            "f set",
            "str get",
            "int get",
            "a parameter set",
            "a parameter literal tuple",
            "k parameter set",
            "k parameter literal dict",
            "a parameter hint str",
            "k parameter hint int",
            "return parameter hint None",
        ],
    ),
    (
        "class C:\n    def f(self, a):  # type: (int) -> str\n        pass",
        [
            "C set",
            "f set",
            "int get",
            "str get",
            "self parameter set",
            "a parameter set",
            "a parameter hint int",
            "return parameter hint str",
        ],
    ),
    (
        "def f(a: 'any text', b: 'B'): pass",
        [
            "1:15 invalid syntax in stringified type hint",
            "f set",
            "B get",
            "a parameter set",
            "b parameter set",
            "a parameter hint any text",
            "b parameter hint B",
        ],
    ),
    ("x: L['|'] = 1", ["x set", "x literal int: 1", "L get", "x hint L['']"]),
]


@pytest.mark.parametrize(("source", "expected"), HINTS, ids=[hint[0][:40] for hint in HINTS])
def test_a_hint_costs_nothing_but_itself(source: str, expected: list[str]) -> None:
    found = read(source)
    assert sorted(found) == sorted(expected)


@pytest.mark.parametrize(
    ("imports", "call", "is_hint"),
    [
        ("from typing import cast", "cast('A', x)", True),
        ("from typing import cast as c", "c('A', x)", True),
        ("import typing", "typing.cast('A', x)", True),
        ("import typing as t", "t.cast('A', x)", True),
        ("from typing_extensions import *", "cast('A', x)", True),
        ("", "cast('A', x)", False),
        ("from sqlalchemy import cast", "cast('A', x)", False),
        ("import typing", "other.cast('A', x)", False),
    ],
)
def test_cast_is_what_the_imports_say(imports: str, call: str, is_hint: bool) -> None:
    assert ("A get" in read(f"{imports}\n{call}\n")) == is_hint


def test_literal_is_what_the_imports_say() -> None:
    assert "A get" not in read("from typing import Literal as L\ndef f(a: L['A']): pass\n")
    assert "A get" in read("from typing import List as L\ndef f(a: L['A']): pass\n")


# ---- errors ----

ERRORS = [
    ((3, 7), "if (n := 1): pass", "1:7 Assignment expressions are only supported in Python 3.8 and greater"),
    ((3, 7), "def f(a, /): pass", "1:10 Positional-only parameters are only supported in Python 3.8 and greater"),
    ((3, 9), "match x:", "1:1 Pattern matching is only supported in Python 3.10 and greater"),
    ((3, 11), "def f[T](): pass", "1:6 Type parameter lists are only supported in Python 3.12 and greater"),
    ((3, 11), "type X = int", "1:1 Type statement is only supported in Python 3.12 and greater"),
    ((3, 13), "f() = 1", "1:1 cannot assign to function call here. Maybe you meant '==' instead of '='?"),
    ((3, 13), "x, None = 1, 2", "1:4 cannot assign to None"),
    ((3, 13), "a, *b, *c = d", "1:1 multiple starred expressions in assignment"),
    ((3, 13), "del f()", "1:5 cannot delete function call"),
    ((3, 13), "for *a in b: pass", "1:5 starred assignment target must be in a list or tuple"),
    ((3, 13), "*a -= b", "1:1 'starred' is an illegal expression for augmented assignment"),
    ((3, 13), "a, -= b", "1:1 'tuple' is an illegal expression for augmented assignment"),
    ((3, 13), "f() += 1", "1:1 'function call' is an illegal expression for augmented assignment"),
    ((3, 13), "f(a=1, a=2)", "1:8 keyword argument repeated: a"),
    ((3, 13), "def f(a=1, b): pass", "1:12 parameter without a default follows parameter with a default"),
    ((3, 13), "def f(*): pass", "1:7 named arguments must follow bare *"),
    ((3, 13), "return 1", "1:1 'return' outside function"),
    ((3, 13), "x = yield", "1:5 'yield' outside function"),
    ((3, 13), "def f(): await x", "1:10 'await' outside async function"),
    ((3, 13), "nonlocal x", "1:1 nonlocal declaration not allowed at module level"),
    ((3, 13), "f(a b)", "1:3 invalid syntax. Perhaps you forgot a comma?"),
    ((3, 13), "x = (1, 2", "1:5 '(' was never closed"),
    ((3, 13), "x = (1]", "1:7 closing parenthesis ']' does not match opening parenthesis '('"),
    ((3, 13), "x = 1 if 2", "1:5 expected 'else' after 'if' expression"),
    ((3, 13), "print 'x'", "1:1 Missing parentheses in call to 'print'. Did you mean print(...)?"),
    ((3, 13), "except A, B:", "1:8 multiple exception types must be parenthesized"),
    ((3, 13), "x = 0777", None),
    ((3, 13), "x <> y", "1:3 invalid syntax.  Maybe you meant '!=' instead of '<>'?"),
    (
        (3, 13),
        "def f(): (yield) = 1",
        "1:11 cannot assign to yield expression here. Maybe you meant '==' instead of '='?",
    ),
    ((3, 13), "def f(): (yield): int", "1:11 illegal target for annotation"),
    ((3, 13), "def f(): g((yield)=1)", '1:13 expression cannot contain assignment, perhaps you meant "=="?'),
    ((3, 13), "f(a): pass", "1:5 invalid syntax"),
    ((3, 13), "class A(x for x in y): pass", "1:11 invalid syntax"),
    ((3, 13), "f(x for x in y,)", "1:3 Generator expression must be parenthesized"),
    ((3, 13), "@f(x for x in y,)", "1:4 Generator expression must be parenthesized"),
    ((3, 13), "match x", "1:8 expected ':'"),
    ((3, 13), "match x y", "1:9 invalid syntax"),
    ((3, 13), "case 1", "1:8 expected ':'"),
    ((3, 13), "case {**a} if b", "1:17 expected ':'"),
    ((3, 13), "case 1 x", "1:9 invalid syntax"),
    ((3, 13), "case {1: a, 1: b}:", "1:7 mapping pattern checks duplicate key (1)"),
    ((3, 13), "case _.a:", "1:8 invalid syntax"),
    ((3, 13), "case _():", "1:8 invalid syntax"),
    ((3, 13), "case *a, *b:", "1:7 multiple starred names in sequence pattern"),
    ((3, 13), "del f(a) b", "1:5 cannot delete function call"),
    ((3, 13), "def f() -> a | b (: pass", "1:18 expected ':'"),
    ((3, 13), "def f() -> lambda None: pass", "1:9 expected ':'"),
    ((3, 13), "def f((a b)): pass", "1:7 invalid syntax"),
    ((3, 13), "if x;", "1:5 invalid syntax"),
    ((3, 13), "from a import b,", "1:17 trailing comma not allowed without surrounding parentheses"),
    ((3, 13), "f(*)", "1:4 Invalid star expression"),
    ((3, 13), "f(1 := 2)", "1:5 invalid syntax"),
    ((3, 13), "[x for x y]", "1:10 'in' expected after for-loop variables"),
    ((3, 13), "f(a b.)", "1:3 invalid syntax. Perhaps you forgot a comma?"),
    ((3, 13), "a print b", "1:3 Missing parentheses in call to 'print'. Did you mean print(...)?"),
    (
        (3, 13),
        "[i for i in a if (j := i) for j in b]",
        "1:31 comprehension inner loop cannot rebind assignment expression target 'j'",
    ),
    (NEWEST, "x = 'a' b 'c'", "1:9 invalid syntax. Is this intended to be part of the string?"),
    (NEWEST, "x = 'a' + b 'c'", "1:9 invalid syntax. Is this intended to be part of the string?"),
    (NEWEST, "x = a if b else pass", "1:17 expected expression after 'else', but statement is given"),
    (NEWEST, "x = pass if b else c", "1:5 expected expression before 'if', but statement is given"),
    (NEWEST, "def f(a: pass", "1:6 '(' was never closed"),
    (NEWEST, "x = bu''", "1:5 'u' and 'b' prefixes are incompatible"),
    (NEWEST, "except* E as 1:", "1:14 cannot use except* statement with literal"),
    (NEWEST, "x = t'\\x4'", None),
    (NEWEST, "del x.__debug__", "1:5 cannot delete __debug__"),
    (NEWEST, "type __debug__ = 1", "1:6 cannot assign to __debug__"),
    ((3, 13), "type T = {a := x}", "1:11 named expression cannot be used within a type alias"),
    ((3, 13), "type T = (yield)", "1:11 yield expression cannot be used within a type alias"),
    ((3, 13), "type T = (await x)", "1:11 await expression cannot be used within a type alias"),
    ((3, 13), "def f[T: (y := 1)](): pass", "1:11 named expression cannot be used within a TypeVar bound"),
    ((3, 13), "def f[T: ((y := 1), x)](): pass", "1:12 named expression cannot be used within a TypeVar constraint"),
    ((3, 13), "def f[**T = (y := 1)](): pass", "1:14 named expression cannot be used within a ParamSpec default"),
    ((3, 13), "class A[T](y := 1): pass", "1:12 named expression cannot be used within the definition of a generic"),
    ((3, 13), "def f[T](x: (y := 1)): pass", "1:14 named expression cannot be used within the definition of a generic"),
    (
        (3, 13),
        "type T = [(y := 1) for a in b]",
        "1:12 assignment expression within a comprehension cannot be used in a type alias",
    ),
    (NEWEST, "x: (y := 1)", "1:5 named expression cannot be used within an annotation"),
    (NEWEST, "def f() -> (yield): pass", "1:13 yield expression cannot be used within an annotation"),
    (NEWEST, "async def f(): x: await y", "1:19 await expression cannot be used within an annotation"),
    (
        NEWEST,
        "async def f(): x: [a async for a in b]",
        "1:19 asynchronous comprehension outside of an asynchronous function",
    ),
    ((2, 7), "f() = 1", "1:1 cannot assign to function call here. Maybe you meant '==' instead of '='?"),
    ((2, 7), "x: int = 1", "1:2 invalid syntax"),
    ((2, 7), "exec a, b", "1:7 invalid syntax"),
    ((2, 7), "exec a b", "1:8 invalid syntax"),
]


@pytest.mark.parametrize(("version", "source", "expected"), ERRORS, ids=[error[1] for error in ERRORS])
def test_what_the_version_rejects_is_rejected(version: tuple[int, int], source: str, expected: str | None) -> None:
    [error] = [text for text in read(source, version) if text[0].isdigit()]
    if expected is not None:
        assert error == expected


@pytest.mark.parametrize("source", [error[1] for error in ERRORS if error[0] == (3, 13) and error[1] != "except A, B:"])
def test_the_running_interpreter_rejects_it_as_well(source: str) -> None:
    with pytest.raises(SyntaxError):
        compile(source + "\n", "s", "exec")


@pytest.mark.parametrize(
    "source",
    [
        "type T = lambda: (y := 1)",
        "type T = (x for x in y)",
        "x: lambda: (y := 1)",
        "x: [(y := 1) for a in b]",
        "x: (a async for a in b)",
        "class A((x for x in y),): pass",
        "f((x for x in y),)",
        "def f():\n y: z = 1\n global z",
        "case {_.a: b}: pass",
        "(y + z).a: int",
        "f'{*x,}'",
        'x = t"""{a =\\\n!r}"""',
        "match(x)",
        "case(x)",
    ],
)
def test_what_is_no_more_than_like_it_is_none(source: str) -> None:
    assert [text for text in read(source) if text[0].isdigit()] == []


KEYS = [
    ("1", "1.0", True),
    ("0x10", "1_6", True),
    ("1e1", "10", True),
    ("True", "1", True),
    ("0", "-0", True),
    ("1", "-1", False),
    ("1 + 2j", "1 + 2.0j", True),
    ("2j", "02j", True),
    ("2", "2j", False),
    ("None", "0", False),
    ("'ab'", '"a" r"b"', True),
    ("'\\x61\\142\\n'", "'ab\\\n\\u000a'", True),
    ("'é'", "'\\xe9'", True),
    ("b'\\xe9'", "b'\\351'", True),
    ("'a'", "b'a'", False),
    ("a.b", "a.b", False),
]


@pytest.mark.parametrize(("one", "other", "is_same"), KEYS)
def test_no_key_of_a_mapping_stands_in_it_twice(one: str, other: str, is_same: bool) -> None:
    source = f"match x:\n case {{{one}: a, {other}: b}}: pass\n"
    assert bool(analyze(source, version=NEWEST).errors) == is_same
    if is_same:
        with pytest.raises(SyntaxError, match="duplicate key"):
            compile(source, "s", "exec")
    else:
        compile(source, "s", "exec")


def test_a_key_is_shown_as_the_language_shows_it() -> None:
    for key in ("-1", "'ab'", "b'a'", '"it\'s"', "'a\\n'", "(1+2j)", "None"):
        source = f"match x:\n case {{{key.strip('()')}: a, {key.strip('()')}: b}}: pass\n"
        [line] = analyze(source, version=NEWEST).errors
        assert line.error is not None
        assert line.error.msg == f"mapping pattern checks duplicate key ({key})"


def test_what_only_the_compiler_rejects_keeps_its_records() -> None:
    assert read("return a.b") == ["1:1 'return' outside function", "return equal a.b", "a get", "a.b get"]
    assert read("f() = a") == ["1:1 cannot assign to function call here. Maybe you meant '==' instead of '='?"]


@pytest.mark.parametrize(
    ("version", "source"),
    [
        ((3, 7), "(a := b)"),  # of another version
        ((3, 9), "match a:\n case b: pass"),
        (NEWEST, "return a"),  # in another place
        (NEWEST, "  a"),
        (NEWEST, "f(a=1, a=b)"),  # the compiler's
        (NEWEST, "*a, *b = c"),
        (NEWEST, "x = y  # type: any text"),  # a hint's
        (NEWEST, "def f(a: 'any text'): pass"),
    ],
)
def test_an_error_of_the_version_the_place_the_compiler_or_a_hint_keeps_the_records(
    version: tuple[int, int], source: str
) -> None:
    lines = [line for line in analyze(source + "\n", version=version).lines if line.error is not None]
    assert lines
    assert lines[0].records


@pytest.mark.parametrize(
    "source", ["f(a b)", "a = 0777", "a b", "f() = a", "f(a=1, b)", "def f(a=1, b): pass", "del f()", "x = f'{a b}'"]
)
def test_an_error_of_the_grammar_drops_them(source: str) -> None:
    line = analyze(source + "\n", version=NEWEST).lines[0]
    assert line.error is not None
    assert line.records == ()


def test_an_exact_reading_is_that_of_the_tables() -> None:
    for source in ("return a", "f() = 1", "def f(a=1, b): pass", "x = 1  # type: ignore[misc]"):
        assert analyze(source, exact=True).errors == []
    source = b"match x:\n  case a, b: pass\n"
    [result] = analyze_files([("a.py", source)], version=(3, 13), exact=True)
    assert result.errors == [(2, 9, "invalid syntax")]
    [result] = analyze_files([("a.py", source)], version=(3, 13))
    assert result.errors == []


# ---- by version ----

VERSIONS = ((2, 7), (3, 6), (3, 7), (3, 8), (3, 10), (3, 11), (3, 13))
#: Which of the versions reject a statement: an "E" for each that does.
BY_VERSION = [
    ("x.None = 1", "EEEEEEE"),
    ("from a import None", "EEEEEEE"),
    ("del x.None", ".EEEEEE"),
    ("del __debug__", "....EEE"),
    ("f(__debug__=1)", "EEEEEEE"),
    ("import __debug__", "EEEEEEE"),
    ("def f(*args, kw): pass", "E......"),
    ("f(**kw, a=1)", "E......"),
    ("o, @= m", "EEEEEEE"),
    ("0 |= r", "EEEEEEE"),
    ("f((*a), b)", "E...EEE"),
    ("x = (*a)", "EEEEEEE"),
    ("def f(): return (await x for x in y)", "EE....."),
    ("def f(): return (x for x in await y)", "EEEEEEE"),
    ("def f(): return [await x for x in y]", "EEEEEEE"),
    ("(x async for x in y)", "EE....."),
    ("async def f(): return [[x async for x in y] for z in w]", "EEEEE.."),
    ("def f(): return ([await y for y in z] for x in w)", "EEEEE.."),
    ("def f(): return [[await y for y in z] for x in w]", "EEEEEEE"),
    ("async def f(): return lambda x=await y: x", "E......"),
    ("x = 'C:\\Users'", ".EEEEEE"),
    ("x = r'C:\\Users'", "......."),
    ("x = u'\\x4'", "EEEEEEE"),
    ("x = '\\N{DIGIT ONE}\\\\x'", "......."),
    ("x = f'{\"#\"}'", "E......"),
    ("x = f'{a # b}'", "EEEEEEE"),
    ("for [a in b] in c: pass", "EEEEEEE"),
    ("[x for [a in b]", "EEEEEEE"),
    ("def f(self):\n self.m: (1, await 2)", "EE....."),
    ("x = 1 \\", "...EEEE"),
    ("class A(x for x in y): pass", "E.EEEEE"),
    ("f(x for x in y,)", "..EEEEE"),
    ("def f(): (yield) += 1", "EEEEEEE"),
    ("{**x for a in b}", "EEEEEEE"),
    ("x = [a for a in b if lambda: c]", "....EEE"),
    ("(y).a: int", "E...EEE"),
    ("((y, z)): int", "EEEEEEE"),
    ("([y]) += 1", "EEEEEEE"),
    ("z[*c]: y", "EEEEEEE"),
    ("z[*c]: y = 1", "EEEEE.."),
    ("f'{*x}'", "EEEEEEE"),
    ("x = 0_3", "EEEEEEE"),
    ('x = f"""{a =\\\n}"""', "EEEEEE."),
    ("x.__debug__ += 1", "EEEE..."),
    ("import __debug__.a", "....EEE"),
    ("[i for x[y := 1] in a]", "EEEEEEE"),
    ("def f():\n if x: from a import *", ".EEEEEE"),
    ("with x: from a import b,", "EEEEEEE"),
    ("async def f(): lambda: await x", "EEEEEEE"),
    ("def f(x, y):\n z: [b for __debug__ in c]", "EEEE..."),
    ("A[*Ts in int]", "EEEEE.."),
    ("f(a=1, b := 2)", "EEEEEEE"),
    ("*a: int", "EEEEEEE"),
    ("f(x := y for z in w)", "EEEE..."),
    ("f(x := y for z in w, 1)", "EEEEEEE"),
    ("def f(): a = [(yield x) for x in y]", "...EEEE"),
    ("def f(): a = (yield x)", "......."),
    ("x = b'a' 'b'", ".EEEEEE"),
    ("x = 'a' rb'b'", "EEEEEEE"),
    ("x = (b'a' # c\n 'b')", ".EEEEEE"),
    ("x = b'a' b'b' br'c'", "......."),
    ("x = b'\xe4'", ".EEEEEE"),
    ("(a, b.c[d]) = e", "......."),
    ("(a, 1) = e", "EEEEEEE"),
    ("a, (b, f()) = e", "EEEEEEE"),
    ("for (a, None) in b: pass", "EEEEEEE"),
    ("f().x |= 1", "......."),
    ("-x |= 1", "EEEEEEE"),
    ("@d;\ndef f(): pass", "EEEEEEE"),
    ("@d # ;\ndef f(): pass", "......."),
]


@pytest.mark.parametrize(("source", "expected"), BY_VERSION, ids=[row[0] for row in BY_VERSION])
def test_each_version_takes_what_it_takes(source: str, expected: str) -> None:
    found = "".join("E" if analyze(source + "\n", version=version).errors else "." for version in VERSIONS)
    assert found == expected


ESCAPES = [
    ('x = "\\x4"', "'unicodeescape' codec can't decode bytes in position 0-2: truncated \\xXX escape"),
    ('x = "C:\\Users"', "'unicodeescape' codec can't decode bytes in position 2-3: truncated \\UXXXXXXXX escape"),
    ('x = "é\\u12"', "'unicodeescape' codec can't decode bytes in position 10-13: truncated \\uXXXX escape"),
    ('x = "\\N{}"', "'unicodeescape' codec can't decode bytes in position 0-2: malformed \\N character escape"),
    ('x = "\\U00110000"', "'unicodeescape' codec can't decode bytes in position 0-9: illegal Unicode character"),
]


@pytest.mark.parametrize(("source", "words"), ESCAPES)
def test_an_escape_that_means_nothing_is_an_error(source: str, words: str) -> None:
    assert read(source, (3, 13))[0] == f"1:5 (unicode error) {words}"
    with pytest.raises(SyntaxError) as raised:
        compile(source, "s", "exec")
    assert raised.value.msg == f"(unicode error) {words}"


def test_an_escape_of_bytes_is_none_of_text() -> None:
    assert read('x = b"a\\x4"', (3, 13))[0] == "1:5 (value error) invalid \\x escape at position 1"
    assert read('x = b"\\u12"', (3, 13))[0] == "x set"


# ---- 3.14, of which no interpreter may be there ----

#: With their errors, of which most have none; (3, 13) rejects those that are marked.
NEWEST_FORMS = [
    ('x = t"Hello {name}"', None, True),
    ('x = T\'{a}\' tR\'{b}\\d\' rT"""{c}\n{d}"""', None, True),
    ('x = t"{name!r} {name!s:>{width}} {value:.{precision}f} {now:%Y-%m-%d}"', None, True),
    ("x = t\"{{}} {a=} {(lambda: b)()} {d['k']!a}\"", None, True),
    ("x = t\"{t'{inner}'} {f'{other}'}\"", None, True),
    ("x = f\"{t'{inner}'}\"", None, True),
    ('x = t"{d["key"]} {e[\'}\']}"', None, True),
    ('x = t"" "y"', "1:5 cannot mix t-string literals with string or bytes literals", True),
    ('x = "y" t"{a}"', "1:5 cannot mix t-string literals with string or bytes literals", True),
    ('x = t"{a b}"', "", True),
    ('x = t"{}"', "", True),
    ("try: x\nexcept A, B: y", None, True),
    ("try: x\nexcept A, b.C, D[0]: y", None, True),
    ("try: x\nexcept* A, B: y", None, True),
    ("try: x\nexcept (A, B) as e: y", None, False),
    ("try: x\nexcept A, B as e: y", "2:8 multiple exception types must be parenthesized when using 'as'", True),
    ("f(**a, b)", "1:9 positional argument follows keyword argument unpacking", True),
    ("f(a=1, b)", "1:9 positional argument follows keyword argument", True),
    ("def f():\n try: x\n finally: return y", None, False),
    ("for x in y:\n try: x\n finally: break", None, False),
    ("for x in y:\n try: x\n finally: continue", None, False),
    ("class A:\n b: B\n def f(self, c: C = 1, *d: *D) -> A: ...\nclass B: ...", None, False),
    ("def f[T: (int, str) = int, *Ts = *tuple[T], **P = [T]](): pass", None, False),
    ("type X[T = int] = list[T]", None, False),
    ("x: yield", "", True),
]


@pytest.mark.parametrize(("source", "error", "is_new"), NEWEST_FORMS, ids=[form[0][:40] for form in NEWEST_FORMS])
def test_the_newest_version_reads_its_reference(source: str, error: str | None, is_new: bool) -> None:
    errors = analyze(source + "\n", version=NEWEST).errors
    assert bool(errors) == (error is not None)
    if error:
        row, column = errors[0].error_position or (0, 0)
        assert errors[0].error is not None
        assert f"{row}:{column} {errors[0].error.msg}" == error
    assert bool(analyze(source + "\n", version=(3, 13)).errors) == is_new


def test_what_a_template_reads_is_read() -> None:
    assert read('x = t"{t\'{inner}\'} {d["key"]:{w}}"') == ["x set", "d get", "w get", "inner get"]
