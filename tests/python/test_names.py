"""The names of a source as Python reads them: occurrences, scopes and symbols.

What the language says of names is compared with the language's own modules in test_names_agreement.py; here is
what the objects look like, and what only quillet says.
"""

from __future__ import annotations

import gc
from pathlib import Path

import pytest

import quillet
from quillet import FileBindings, Occurrence, analyze_files, bind

SHOP = Path(__file__).resolve().parent.parent.parent / "examples" / "shop.py"


def named(bindings: FileBindings, text: str) -> list[Occurrence]:
    return [occurrence for occurrence in bindings.occurrences if occurrence.text == text]


def test_an_occurrence_has_a_place_a_role_and_a_variable() -> None:
    bindings = bind("def add(a, *, b=1):\n    return a.x(b)\n", version=(3, 12))
    rows = [(o.line, o.column, o.end_column, o.text, o.role, o.kind) for o in bindings.occurrences]
    assert rows == [
        (1, 5, 8, "add", "definition", "function"),
        (1, 9, 10, "a", "definition", "parameter"),
        (1, 15, 16, "b", "definition", "parameter"),
        (2, 12, 13, "a", "read", None),
        (2, 14, 15, "x", "call", None),
        (2, 16, 17, "b", "read", None),
    ]
    add, a, _, read, attribute, _ = bindings.occurrences
    assert (add.scope, a.scope) == (0, 1)
    assert a.symbol is read.symbol
    assert a.symbol is not None
    assert (a.symbol.name, a.symbol.scope, a.symbol.occurrences) == ("a", 1, (1, 3))
    assert (attribute.is_attribute, attribute.receiver, attribute.symbol) == (True, 3, None)
    assert (read.is_attribute, read.receiver) == (False, None)


def test_columns_are_bytes_of_utf_8_and_names_are_normalised() -> None:
    bindings = bind("'é'; ﬁ = fi\n", version=(3, 12))
    first, second = bindings.occurrences
    assert [(o.text, o.column, o.end_column) for o in (first, second)] == [("ﬁ", 7, 10), ("fi", 13, 15)]
    assert first.symbol is second.symbol
    assert first.symbol is not None
    assert first.symbol.name == "fi"


def test_a_byte_order_mark_counts_for_no_column() -> None:
    [occurrence] = bind(b"\xef\xbb\xbfx = 1\n").occurrences
    assert (occurrence.line, occurrence.column) == (1, 1)


def test_sources_are_decoded_as_they_ask() -> None:
    first, second = bind("# coding: latin-1\né = é\n".encode("latin-1"), version=(3, 12)).occurrences
    assert (first.text, first.line, second.column) == ("é", 2, 6)


def test_names_in_all_places_are_marked() -> None:
    source = (
        "@decorated.by(1)\n"
        "class C(m.Base, metaclass=Meta):\n"
        "    x: 'List[int]' = []  # type: Comment\n"
        "    x += 1\n"
        "    del x\n"
    )
    flags = {(o.text, o.line): sorted(o.flags) for o in bind(source, version=(3, 12)).occurrences}
    assert flags["decorated", 1] == []
    assert flags["by", 1] == ["decorator"]
    assert flags["m", 2] == []
    assert flags["Base", 2] == ["base"]
    assert flags["Meta", 2] == []
    assert flags["List", 3] == flags["int", 3] == ["annotation", "string"]
    assert "comment" in flags["Comment", 3]
    assert flags["x", 4] == ["augmented"]
    roles = [o.role for o in named(bind(source, version=(3, 12)), "x")]
    assert roles == ["write", "write", "delete"]


@pytest.mark.parametrize(
    ("source", "expected"),
    [
        ("x -= 1", "x write"),
        ("x.y -= z", "x read, y write, z read"),
        ("def f() -> x: pass", "f definition, x read"),
        ("(f)(x)", "f call, x read"),
        ("(a\n .b)(x)", "a read, b call, x read"),
        ("(f, g)(x)", "f read, g read, x read"),
        ("f[i](x)", "f read, i read, x read"),
    ],
)
def test_roles_follow_from_what_stands_beside(source: str, expected: str) -> None:
    assert ", ".join(f"{o.text} {o.role}" for o in bind(source, version=(3, 12)).occurrences) == expected


def test_a_condition_ends_a_lambda_that_a_loop_goes_through() -> None:
    bindings = bind("[x() for x in lambda: a, lambda: b if x()]\n", version=(2, 7))
    assert [(o.text, bindings.scopes[o.scope].kind) for o in bindings.occurrences] == [
        ("x", "module"),
        ("x", "module"),
        ("a", "lambda"),
        ("b", "lambda"),
        ("x", "module"),
    ]


@pytest.mark.parametrize(
    ("decorator", "marked"),
    [("a.b(c)", ["b"]), ("a[b](c)", ["a"]), ("(a)", ["a"]), ("[a, b][0]", []), ("a or b", ["a", "b"])],
)
def test_a_decorator_is_the_name_that_decorates(decorator: str, marked: list[str]) -> None:
    occurrences = bind(f"@{decorator}\ndef f(): pass\n", version=(3, 12)).occurrences
    assert [o.text for o in occurrences if "decorator" in o.flags] == marked


def test_scopes_have_extents_and_symbols() -> None:
    bindings = bind("class Shop:\n    def total(self):\n        return [i for i in self]\n\n# end\n", version=(3, 12))
    rows = [(s.kind, s.name, s.parent, s.first_line, s.last_line) for s in bindings.scopes]
    assert rows == [
        ("module", "", None, 1, 5),
        ("class", "Shop", 0, 1, 3),
        ("function", "total", 1, 2, 3),
        ("comprehension", "", 2, 3, 3),
    ]
    assert [symbol.name for symbol in bindings.scopes[2].symbols] == ["self"]
    comprehension = bindings.scopes[3]
    assert (comprehension.column, comprehension.end_column) == (16, 33)


def test_a_symbol_leads_to_the_one_that_owns_its_variable() -> None:
    bindings = bind("def f():\n    x = 1\n    def g():\n        return x\n", version=(3, 12))
    outer = next(symbol for symbol in bindings.scopes[1].symbols if symbol.name == "x")
    [inner] = bindings.scopes[2].symbols
    assert inner.is_free()
    assert not outer.is_free()
    assert inner.variable is outer
    assert outer.variable is outer
    assert (inner.occurrences, outer.occurrences) == ((3,), (1, 3))
    assert bindings.occurrences[3].symbol is outer


def test_names_that_no_statement_binds_belong_to_the_module() -> None:
    bindings = bind("def f():\n    return len(x)\n")
    [occurrence] = named(bindings, "len")
    assert occurrence.symbol is not None
    assert (occurrence.symbol.scope, occurrence.symbol.is_listed) == (0, False)
    assert [symbol.name for symbol in bindings.scopes[0].symbols] == ["f"]


def test_star_imports_are_marked() -> None:
    assert bind("from m import *\n").scopes[0].has_star_import
    assert not bind("from m import a\n").scopes[0].has_star_import


def test_a_broken_definition_is_one_and_has_its_body() -> None:
    bindings = bind(SHOP.read_bytes(), version=(3, 12))
    [add] = named(bindings, "add")
    assert (add.role, add.kind, bindings.scopes[add.scope].name) == ("definition", "function", "Basket")
    [scope] = [scope for scope in bindings.scopes if scope.name == "add"]
    assert (scope.kind, scope.first_line, scope.last_line) == ("function", 9, 10)
    definition, read = named(bindings, "count")
    assert definition.kind == "parameter"
    assert read.symbol is definition.symbol
    assert bindings.scopes[read.scope] == scope


@pytest.mark.parametrize("source", ["", "\n", "# x\n", "\\", "\0", "(((", "'''", "def", "class", "\xff", "\udc80"])
def test_any_source_is_bound(source: str) -> None:
    for version in ((2, 7), (3, 12)):
        bindings = bind(source, version=version)
        assert bindings.scopes[0].kind == "module"
        assert all(occurrence.text for occurrence in bindings.occurrences)


def test_sequences_are_sliced_and_counted_from_the_end() -> None:
    occurrences = bind("a, b, c, d\n").occurrences
    assert len(occurrences) == 4
    assert occurrences[-1].text == "d"
    assert [o.text for o in occurrences[1:3]] == ["b", "c"]
    assert [o.text for o in occurrences[::-2]] == ["d", "b"]
    with pytest.raises(IndexError):
        occurrences[4]


def test_wrong_arguments_are_refused() -> None:
    with pytest.raises(TypeError):
        bind(1)  # type: ignore[arg-type]
    with pytest.raises(ValueError, match="version"):
        bind("", version=(1, 5))
    with pytest.raises(quillet.SourceEncodingError):
        bind(b"# coding: nothing-such\n")


def test_bindings_are_let_go_without_the_collector() -> None:
    gc.collect()
    gc.disable()
    try:
        bindings = bind("def f():\n    global x\n    x = y\n")
        assert list(bindings.occurrences)
        assert bindings.scopes[0].symbols[0].occurrences
        del bindings
        assert gc.collect() == 0
    finally:
        gc.enable()


# ---- of many files ----


def test_results_of_many_files_have_bindings_when_asked() -> None:
    files = [("a.py", b"x = 1\n"), ("b.py", b"# coding: nothing-such\n"), ("c.py", b"# coding: latin-1\n\xe9 = 1\n")]
    first, second, third = analyze_files(files, bindings=True)
    assert [o.text for o in first.bindings.occurrences] == ["x"]
    assert first.bindings is first.bindings
    with pytest.raises(ValueError, match="nothing-such"):
        second.bindings  # noqa: B018
    assert [o.text for o in third.bindings.occurrences] == ["é"]
    [without] = analyze_files(files[:1])
    with pytest.raises(ValueError, match="not asked"):
        without.bindings  # noqa: B018


def test_records_are_the_same_with_bindings() -> None:
    source = SHOP.read_bytes()
    [without] = analyze_files([("shop.py", source)])
    [with_bindings] = analyze_files([("shop.py", source)], bindings=True)
    assert list(with_bindings.records) == list(without.records)


def test_occurrences_are_columns() -> None:
    pyarrow = pytest.importorskip("pyarrow")
    files = [("a.py", "class C:\n    def f(self): return self.é\n".encode()), ("b.py", b"x, = y = len\n")]
    with analyze_files(files, bindings=True) as results:
        table = pyarrow.table(results.occurrences)
    table.validate(full=True)
    rows = table.to_pylist()
    names = [(row["path"], row["index"], row["line"], row["column"], row["text"], row["role"]) for row in rows]
    assert names == [
        ("a.py", 0, 1, 7, "C", "definition"),
        ("a.py", 1, 2, 9, "f", "definition"),
        ("a.py", 2, 2, 11, "self", "definition"),
        ("a.py", 3, 2, 25, "self", "read"),
        ("a.py", 4, 2, 30, "é", "read"),
        ("b.py", 0, 1, 1, "x", "write"),
        ("b.py", 1, 1, 6, "y", "write"),
        ("b.py", 2, 1, 10, "len", "read"),
    ]
    attribute = rows[4]
    assert attribute["end_column"] == 32
    assert (attribute["receiver"], attribute["is_attribute"]) == (3, True)
    assert (attribute["symbol"], attribute["symbol_name"], attribute["kind"]) == (None, None, None)
    assert (attribute["scope_name"], rows[3]["symbol_name"], rows[3]["receiver"]) == ("C.f", "self", None)
    assert rows[2]["symbol"] == rows[3]["symbol"]
    assert [row["kind"] for row in rows[:3]] == ["class", "function", "parameter"]
    for column in ("path", "role", "kind"):
        dictionary = table.column(column).chunk(0).dictionary.to_pylist()
        assert len(dictionary) == len(set(dictionary))


def test_columns_say_what_objects_say() -> None:
    pyarrow = pytest.importorskip("pyarrow")
    paths = sorted(Path(quillet.__file__).parent.glob("*.py"))
    with analyze_files(paths, bindings=True) as results:
        rows = pyarrow.table(results.occurrences).to_pylist()
    expected = []
    for result in analyze_files(paths, bindings=True):
        for index, o in enumerate(result.bindings.occurrences):
            name = None if o.symbol is None else o.symbol.name
            place = (result.path, index, o.line, o.column, o.end_column)
            expected.append((*place, o.text, o.role, o.kind, o.flags, o.receiver, o.is_attribute, o.scope, name))
    flags = ("decorator", "base", "annotation", "augmented", "comment", "string")
    plain = ("path", "index", "line", "column", "end_column", "text", "role", "kind")
    rest = ("receiver", "is_attribute", "scope", "symbol_name")
    got = [
        (*(row[key] for key in plain), frozenset(flag for flag in flags if row[flag]), *(row[key] for key in rest))
        for row in rows
    ]
    assert len(got) > 1000
    assert got == expected


def test_columns_of_definitions_without_a_name() -> None:
    pyarrow = pytest.importorskip("pyarrow")
    source = b"class:\n    def f(self): x = 1\ndef (a): y = a\n"
    with analyze_files([("a.py", source)], bindings=True) as results:
        rows = pyarrow.table(results.occurrences).to_pylist()
    assert [(row["text"], row["scope_name"]) for row in rows] == [
        ("f", ""), ("self", "f"), ("x", "f"), ("a", ""), ("y", ""), ("a", ""),
    ]  # fmt: skip


def test_columns_need_bindings() -> None:
    with analyze_files([]) as results, pytest.raises(ValueError, match="not asked"):
        results.occurrences.__arrow_c_stream__()
