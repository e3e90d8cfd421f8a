"""Questions to an index: which records answer, how they are shown, how the command ends."""

from __future__ import annotations

import json
import sys
from pathlib import Path
from typing import Any

import pytest

import quillet
from indexing import SHOP, found, make_index, run
from quillet.cli.defs import facts_of
from quillet.cli.find_options import OPTIONS, plain_parameters
from quillet.cli.index_commands import find
from quillet.cli.outline import _hints, _parameters
from quillet.index.questions import DEFINING_USES, Folder, match_of
from quillet.index.store import FUNCTION


@pytest.fixture
def shop(tmp_path: Path) -> Path:
    make_index(tmp_path, shop=SHOP)
    return tmp_path


@pytest.mark.parametrize(
    ("arguments", "places"),
    [
        (["LIMIT"], ["4:1"]),
        (["D", "--import"], ["2:32"]),
        (["os.path.join", "--call"], ["21:16"]),
        (["join"], []),
        ([".join", "--get"], ["21:16"]),
        (["join", "--match", "suffix", "--call"], ["21:16"]),
        (["path.join", "--match", "suffix", "--call"], ["21:16"]),
        (["ath.join", "--match", "suffix"], []),
        (["self.price", "--set"], ["11:9"]),
        ([".price", "--set"], ["11:9"]),
        (["*price", "--set"], ["8:5", "11:9"]),
        (["item", "--param"], ["15:19"]),
        (["item", "--set"], []),
        (["item", "--hint"], ["15:19"]),
        (["item", "--param", "--get"], ["15:19", "17:31"]),
        (["Item", "--call"], ["26:14"]),
        (["shop.add", "--call"], ["26:5"]),
        (["Shop.add"], ["15:9"]),
        (["Shop.add", "--return"], ["18:9"]),
        (["add", "--return"], ["18:9"]),
        (["price", "--scope", "Item", "--set"], ["8:5"]),
        (["name", "--scope", "path"], ["20:20", "21:37"]),
        (["name", "--scope", "Shop.path"], ["20:20", "21:37"]),
        (["name", "--scope", "Item"], []),
        (["nowhere"], []),
    ],
)
def test_the_places_of_a_name(shop: Path, arguments: list[str], places: list[str]) -> None:
    assert found(*arguments, cwd=shop) == places


def test_a_place_is_one_line_with_its_source(shop: Path) -> None:
    result = run("find", "os.path.join", cwd=shop)
    assert (result.returncode, result.stderr) == (0, "")
    assert result.stdout == "shop.py:21:16: return os.path.join('shop', name)\n"


def test_long_says_what_is_said_of_the_name(shop: Path) -> None:
    assert run("find", "os.path.join", "--call", "--long", cwd=shop).stdout.splitlines() == [
        "shop.py:21:16: return os.path.join('shop', name)",
        "    os.path.join  called with ('shop',name)  in Shop.path",
    ]


def test_json_is_an_object_a_record(shop: Path) -> None:
    (row,) = map(json.loads, run("find", "os.path.join", "--call", "--json", cwd=shop).stdout.splitlines())
    assert row == {
        "type": "record",
        "path": "shop.py",
        "line": 21,
        "column": 16,
        "scope": "Shop.path",
        "name": "os.path.join",
        "kind": "called",
        "detail": "('shop',name)",
        "is_parameter": False,
        "source": "        return os.path.join('shop', name)",
        "changed": False,
        "role": "call",
        "flags": [],
        "receiver": "os.path",
    }


def test_nothing_found_is_1_and_silent(shop: Path) -> None:
    result = run("find", "nowhere", cwd=shop)
    assert (result.returncode, result.stdout, result.stderr) == (1, "", "")


def test_the_nearest_index_above_is_asked(shop: Path) -> None:
    (shop / "sub").mkdir()
    result = run("find", "LIMIT", cwd=shop / "sub")
    assert result.returncode == 0
    assert result.stdout.endswith("shop.py:4:1: LIMIT: int = 10\n")


def test_without_an_index_the_files_are_looked_through(tmp_path: Path) -> None:
    (tmp_path / "shop.py").write_text(SHOP)
    (tmp_path / "b.py").write_text("from shop import Shop\n")
    result = run("find", "Shop", cwd=tmp_path)
    assert (
        result.stdout == "b.py:1:18: from shop import Shop\nshop.py:14:7: class Shop:\nshop.py:25:12: shop = Shop()\n"
    )
    assert result.stderr == ""
    assert run("find", "nowhere", cwd=tmp_path).returncode == 1
    assert run("find", "SHOP", cwd=tmp_path).stderr == "quillet: nothing found; try: Shop, shop\n"
    assert run("find", "SHO?", cwd=tmp_path).stderr == "quillet: nothing found; try: 'Sho?', 'sho?'\n"
    assert run("find", "SELF.PR*", "--set", cwd=tmp_path).stderr == "quillet: nothing found; try: 'self.pr*' --set\n"
    assert run("find", "Shop", "--raise", cwd=tmp_path).stderr == (
        "quillet: nothing found; try: Shop --set, Shop --get, Shop --call, shop --set, shop --get, shop --import\n"
    )
    assert run("find", "Shop", "--index", "none", cwd=tmp_path).returncode == 2
    assert run("defs", "shop.py", cwd=tmp_path).returncode == 0
    assert run("outline", "shop.py", cwd=tmp_path).returncode == 0
    result = run("stats", cwd=tmp_path)
    assert result.returncode == 2
    assert "quillet index ." in result.stderr


@pytest.mark.parametrize(
    ("arguments", "near"),
    [
        (["price", "--call"], "price --set, price --get, price --param, .price --set"),
        (["items"], ".items"),
        (["limit"], "LIMIT"),
        (["join", "--call"], ".join --call"),
        (["os.path.Join", "--call"], "os.path.join --call"),
        (["OS.path.JOIN"], "os.path.join"),
        ([".shop"], "shop"),
        (["self.price", "--scope", "Shop"], "self.price"),
        (["LIMIT", "--return"], "LIMIT --set, LIMIT --hint"),
        (["os", "--hint"], "os --set, os --get, os --import"),
        (["add", "--hint", "--raise"], "add --set, add --def, .add --get, .add --call"),
        (["ITEM*"], "'Item*', 'item*'"),
        (["*PRICE", "--set"], "'*price' --set"),
        (["Self.?TEMS"], "'self.?tems'"),
        ([".Items"], ".items"),
        (["nope*"], None),
        (["x y"], None),
    ],
)
def test_nothing_found_says_what_is_near(shop: Path, arguments: list[str], near: str | None) -> None:
    result = run("find", *arguments, cwd=shop)
    assert (result.returncode, result.stdout) == (1, "")
    assert result.stderr == (f"quillet: nothing found; try: {near}\n" if near else "")


USES = """\
import os.path, a.b as c
from x.y import z as w, q
@deco.rate(3)
@plain
class A(Base, k.M, metaclass=Meta):
    def f(self, a: int = D):
        self.x += a.b[0].c(d=1)
        del self.y
        raise Err.Sub(1) from e
        return super().f(x=1)[0].g() + g(k=1) + g(*a) + g(1)
x = x + x
try: raise Bare
except (E, F.G) as h: raise
y = lambda p: p
z: "List[int]" = 1
def n():
    global t
    t = 1
"""


@pytest.mark.parametrize(
    ("arguments", "places"),
    [
        (["g", "--call"], ["10:40", "10:49", "10:57"]),
        ([".g", "--call"], ["10:34"]),
        (["g", "--call", "--any"], ["10:34", "10:40", "10:49", "10:57"]),
        ([".f", "--call"], ["10:24"]),
        (["super", "--call"], ["10:16"]),
        (["plain", "--call"], []),
        (["plain", "--decorator"], ["4:2"]),
        (["plain", "--get"], ["4:2"]),
        (["deco.rate", "--decorator"], ["3:2"]),
        (["deco.rate", "--call"], ["3:2"]),
        (["Base", "--base"], ["5:9"]),
        (["k.M", "--base"], ["5:15"]),
        (["Meta", "--base"], []),
        (["metaclass", "--keyword"], ["5:20"]),
        (["d", "--keyword"], ["7:28"]),
        (["k", "--keyword"], ["10:42"]),
        (["x", "--keyword"], ["10:26"]),
        (["x", "--get"], ["11:5", "11:9"]),
        (["x", "--set"], ["11:1"]),
        (["self.x", "--set"], ["7:9"]),
        (["self.y", "--delete"], ["8:13"]),
        (["Err.Sub", "--raise"], ["9:15"]),
        (["Bare", "--raise"], ["12:12"]),
        (["e", "--raise"], []),
        (["int", "--annotation"], ["6:20", "15:10"]),
        (["D", "--annotation"], []),
        (["A", "--def"], ["5:7"]),
        (["f", "--def"], ["6:9"]),
        (["x", "--def"], []),
        (["p", "--param"], ["14:12"]),
        (["x.y", "--import"], ["2:6"]),
        (["x.y.z", "--import"], ["2:22"]),
        (["os", "--import"], ["1:8"]),
        (["os.path", "--import"], ["1:8"]),
        (["a.b", "--import"], ["1:17"]),
        (["F.G", "--get"], ["13:12"]),
        (["t", "--set", "--scope", "n"], []),
        (["t", "--set", "--scope", ""], ["18:5"]),
        (["g", "--call", "--scope", "A.f"], ["10:40", "10:49", "10:57"]),
        (["g", "--call", "--path", "b*"], []),
        (["g", "--call", "--path", "a.py"], ["10:40", "10:49", "10:57"]),
    ],
)
def test_every_occurrence_is_found_by_what_it_does(tmp_path: Path, arguments: list[str], places: list[str]) -> None:
    make_index(tmp_path, a=USES)
    assert found(*arguments, cwd=tmp_path) == places


def test_answers_can_be_counted_and_their_files_named(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = x\n", b="x(1)\n", c="y = 1\n")
    assert run("find", "x", "-c", cwd=tmp_path).stdout == "3\n"
    assert run("find", "x", "--files", cwd=tmp_path).stdout == "a.py\nb.py\n"
    assert run("find", "nothing", "-c", cwd=tmp_path).stdout == "0\n"
    assert run("find", "x", "-c", "-l", cwd=tmp_path).returncode == 2


def test_calls_agree_with_the_standard_library(tmp_path: Path) -> None:
    import ast

    source = Path(ast.__file__).read_text(encoding="utf-8")
    (tmp_path / "a.py").write_text(source, encoding="utf-8")
    expected = set()
    for node in ast.walk(ast.parse(source)):
        if isinstance(node, ast.Call) and isinstance(node.func, ast.Name | ast.Attribute):
            name = node.func.id if isinstance(node.func, ast.Name) else node.func.attr
            expected.add((node.func.end_lineno, name))
    result = run("find", "*", "--call", "--json", cwd=tmp_path)
    rows = [json.loads(line) for line in result.stdout.splitlines()]
    assert {(row["line"], row["name"].rpartition(".")[2]) for row in rows} == expected


def test_a_star_import_is_found_by_its_name(tmp_path: Path) -> None:
    make_index(tmp_path, a="from b import *\nx = 1\n")
    assert found("*", "--match", "exact", cwd=tmp_path) == ["1:15"]


def test_names_that_look_like_patterns_or_sql_are_names(tmp_path: Path) -> None:
    make_index(tmp_path, a="x['a%_'] = 1\ny[0] = 2\n")
    assert found("y[0]", cwd=tmp_path) == ["2:1"]
    assert found("?[0]", cwd=tmp_path) == ["2:1"]
    assert found("' OR 1 --", cwd=tmp_path) == []


def test_control_characters_of_the_source_do_not_reach_the_terminal(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = '\x1b[2J' # \x07\n")
    assert run("find", "x", cwd=tmp_path).stdout == "a.py:1:1: x = '\\x1b[2J' # \\x07\n"


def test_lines_of_another_encoding_are_shown(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_bytes("# coding: latin-1\nx = 'ä'\n".encode("latin-1"))
    make_index(tmp_path)
    assert run("find", "x", cwd=tmp_path).stdout == "a.py:2:1: x = 'ä'\n"


def test_defs_lists_what_module_and_classes_define(shop: Path) -> None:
    lines = run("defs", "shop.py", cwd=shop).stdout.splitlines()
    assert [line.split(" ", 1)[0] for line in lines] == [
        f"shop.py:{place}:" for place in ("4:1", "7:7", "8:5", "10:9", "14:7", "15:9", "20:9", "24:5")
    ]
    lines = run("defs", "--imports", "shop.py", cwd=shop).stdout.splitlines()
    assert [line.split(" ", 1)[0] for line in lines[:3]] == ["shop.py:1:8:", "shop.py:2:32:", "shop.py:4:1:"]


def test_outline_is_a_tree_with_parameters_and_hints(shop: Path) -> None:
    assert run("outline", "shop.py", cwd=shop).stdout.splitlines() == [
        " 7 class Item",
        "10     def __init__(self, price: D) -> None",
        "14 class Shop",
        "15     def add(self, item: Item, count=1)",
        "20     def path(self, name)",
        "24 def main()",
    ]


def test_outline_has_broken_definitions_marked(tmp_path: Path) -> None:
    source = "class Basket:\n    def add(self, item, count=1)\n        def inner(): pass\n\n    def total(self): pass\n"
    (tmp_path / "shop.py").write_text(source + "class Broken(A)\n    def kept(self): pass\n")
    assert run("outline", "shop.py", cwd=tmp_path).stdout.splitlines() == [
        "1 class Basket",
        "2     def add(self, item, count=1)  syntax error",
        "3         def inner()",
        "5     def total(self)",
        "6 class Broken  syntax error",
        "7     def kept(self)",
    ]


def test_outline_has_signatures_as_the_source_has_them(tmp_path: Path) -> None:
    source = """\
async def f(a, *args, b=1, **kw): pass
def g[T: int](
    a: T, /,  # a comment: with (brackets
    *,
    b="x: (",
    c=(lambda q: {q: 1}),
) -> dict[str,
          T]: pass
def commented(a, *b, c=1):
    # type: (int, str, bytes) -> None
    pass
def broken(a, *b, c=1) = 3
def open(a, *b,
def long(%s): pass
"""
    (tmp_path / "a.py").write_text("\ufeff" + source % ", ".join(f"a{i}=0" for i in range(100)), encoding="utf-8")
    run("index", ".", "--python", "3.12", cwd=tmp_path)
    lines = run("outline", "a.py", cwd=tmp_path).stdout.splitlines()
    assert lines[:3] == [
        " 1 async def f(a, *args, b=1, **kw)",
        ' 2 def g[T: int](a: T, /, *, b="x: (", c=(lambda q: {q: 1})) -> dict[str, T]',
        " 9 def commented(a, *b, c=1)",
    ]
    assert lines[-1].startswith("14 def long(a0=0, a1=0, ")
    assert lines[-1].endswith("…")
    assert len(lines[-1]) == len("14 def long") + 160


def test_outline_has_hints_of_comments(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("def f(a, b=1, *c):  # type: (int, str, bytes) -> None\n    pass\n")
    assert run("outline", "a.py", cwd=tmp_path).stdout == "1 def f(a: int, b: str=1, *c: bytes) -> None\n"


class Counting(list[Any]):
    """Counts the items that it gives."""

    given = 0

    def __getitem__(self, index: Any) -> Any:
        items = super().__getitem__(index)
        self.given += len(items) if isinstance(index, slice) else 1
        return items


def test_outline_reads_no_more_for_a_signature_than_belongs_to_it(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("def f(a, b: int): pass\ndef g(c\n" * 100)
    hits = Counting(facts_of(str(path), None, Folder.everything(uses=DEFINING_USES)).hits)
    heads = [place for place, hit in enumerate(hits) if hit.opens == FUNCTION]
    assert [_hints(hits, place) for place in heads] == [{"b": "int"}] * 100
    assert hits.given <= 6 * len(heads)
    bindings = quillet.bind(path.read_bytes())
    occurrences = Counting(bindings.occurrences)
    names = [place for place, occurrence in enumerate(occurrences) if occurrence.text in ("f", "g")]
    parameters = [list(_parameters(bindings, occurrences, place)) for place in names]
    assert parameters == [["a", "b"], ["c"]] * 100
    assert occurrences.given <= 6 * len(names)


def test_outline_as_objects(tmp_path: Path) -> None:
    source = "class A:\n    class B:\n        async def f(self,\n            a=1): return lambda: [0 for _ in a]\n"
    long = ", ".join(f"a{i}" for i in range(100))
    (tmp_path / "a.py").write_text(f"{source}def long({long}): pass\ndef broken(b c): pass\n")
    rows = [json.loads(line) for line in run("outline", "a.py", "--json", cwd=tmp_path).stdout.splitlines()]
    assert rows[1:3] == [
        {
            "type": "definition",
            "path": "a.py",
            "line": 2,
            "column": 11,
            "scope": "A",
            "name": "B",
            "kind": "class",
            "signature": "",
            "depth": 1,
            "is_broken": False,
        },
        {
            "type": "definition",
            "path": "a.py",
            "line": 3,
            "column": 19,
            "scope": "A.B",
            "name": "f",
            "kind": "async function",
            "signature": "(self, a=1)",
            "depth": 2,
            "is_broken": False,
        },
    ]
    assert (rows[3]["kind"], rows[3]["is_broken"]) == ("function", False)
    assert rows[3]["signature"].endswith(", a99)")
    assert (rows[4]["name"], rows[4]["is_broken"]) == ("broken", True)
    assert [run("outline", name, "--json", cwd=tmp_path).returncode for name in ("a.py", "none.py")] == [0, 2]


def test_exclude_leaves_files_out_with_an_index_and_without(tmp_path: Path) -> None:
    for name in ("a.py", "tests/a.py", "lib/tests/b.py", "lib/#c.py", "gen.py"):
        (tmp_path / name).parent.mkdir(parents=True, exist_ok=True)
        (tmp_path / name).write_text("x = 1\n")
    (tmp_path / ".gitignore").write_text("gen.py\n")

    def files(*exclude: str) -> list[str]:
        return run("find", "x", "-l", *(f"--exclude={pattern}" for pattern in exclude), cwd=tmp_path).stdout.split()

    assert files("!gen.py", "lib") == ["a.py", "gen.py", "tests/a.py"]
    for _ in range(2):
        assert files() == ["a.py", "lib/#c.py", "lib/tests/b.py", "tests/a.py"]
        assert files("tests/") == ["a.py", "lib/#c.py"]
        assert files("/tests", "#c.py") == ["a.py", "lib/tests/b.py"]
        assert files("*.py", "!a.py") == ["a.py", "tests/a.py"]
        assert files("lib/*", "!lib/tests") == ["a.py", "lib/tests/b.py", "tests/a.py"]
        plain = run("find", "x", "-l", "--exclude", "a.py", "--exclude", "b.py", cwd=tmp_path)
        assert plain.stdout.split() == ["lib/#c.py"]
        assert run("find", "x", "--exclude", "*", cwd=tmp_path).returncode == 1
        make_index(tmp_path)
    (tmp_path / "sub").mkdir()
    result = run("find", "x", "-l", "--exclude", "/tests/", "--exclude", "lib", cwd=tmp_path / "sub")
    assert result.stdout.split() == [str(tmp_path / "a.py")]


@pytest.mark.parametrize("command", ["defs", "outline"])
def test_a_file_need_not_be_in_the_index(shop: Path, command: str) -> None:
    (shop / "other.py").write_text("def later(): pass\n")
    assert "later" in run(command, "other.py", cwd=shop).stdout
    result = run(command, "missing.py", cwd=shop)
    assert result.returncode == 2
    assert result.stderr == "quillet: missing.py: No such file or directory\n"


def test_stats_counts(shop: Path) -> None:
    values = json.loads(run("stats", "--json", cwd=shop).stdout)
    assert values["files"] == 1
    assert values["lines"] == SHOP.count("\n")
    assert values["records"] == sum(values["kinds"].values())
    assert values["errors"] == 0
    assert run("stats", cwd=shop).stdout.splitlines()[3].split() == ["files", "1"]
    assert "return" not in values["names"], "which is said of functions and is no name"


@pytest.mark.parametrize(
    ("name", "match"),
    [("a", "exact"), ("a.b", "exact"), (".a", "suffix"), ("a*", "glob"), (".a?", "glob"), ("x[0]", "exact")],
)
def test_the_form_of_a_name_says_how_it_is_meant(name: str, match: str) -> None:
    assert match_of(name) == match


@pytest.mark.parametrize(
    ("wanted", "names"),
    [
        ("Shop", "a b c"),
        ("add", "a b c"),
        ("Shop.add", "a b c"),
        ("add.inner", "c"),
        ("Sho", ""),
        ("", "d"),
        ("S*.a??", "a b"),
        ("*inner", "c"),
        ("?hop*", "a b c"),
    ],
)
def test_scopes_are_matched_by_whole_names(tmp_path: Path, wanted: str, names: str) -> None:
    source = "class Shop:\n def add(self):\n  a = 1\n  b = 1\n  def inner():\n   c = 1\nd = 1\n"
    make_index(tmp_path, a=source)
    result = run("find", "?", "--set", "--json", "--scope", wanted, cwd=tmp_path)
    assert [json.loads(line)["name"] for line in result.stdout.splitlines()] == names.split()


def test_a_question_loads_little(shop: Path) -> None:
    import subprocess

    from indexing import ENVIRONMENT

    code = (
        "import sys\nbefore = set(sys.modules)\nfrom quillet.cli import main\n"
        "try: main(['find', 'LIMIT'])\nexcept SystemExit: pass\n"
        "assert 'quillet.index.questions' in sys.modules\n"
        "loaded = {'click', 'collections', 'contextlib', 'enum', 're', 'typing'} & (set(sys.modules) - before)\n"
        "assert not loaded, loaded"
    )
    subprocess.run([sys.executable, "-c", code], cwd=shop, env=ENVIRONMENT, check=True, stdout=subprocess.DEVNULL)


@pytest.mark.parametrize(
    "arguments",
    [
        ["total"],
        ["total", "--set", "--get"],
        ["--call", "--import", "--param", "os.path.join", "--hint", "--return"],
        ["--scope", "Shop", "-l", "add", "--json", "--match", "suffix"],
        ["add", "--any", "--count", "--path", "src/*", "--def"],
        ["add", "--long", "--index", "other.index"],
        ["--index", "a", "--index", "b", "add"],
        ["test_*"],
        [".total", "--scope", ""],
        ["total", "--root", "a", "--root", "b"],
        [""],
    ],
)
def test_a_plain_question_is_read_as_click_reads_it(arguments: list[str]) -> None:
    context = find.make_context("find", list(arguments))
    assert plain_parameters(arguments) == context.params
    assert set(context.params) == {"name", *(option.parameter for option in OPTIONS)}


@pytest.mark.parametrize(
    "arguments",
    [
        [],
        ["--help"],
        ["a", "b"],
        ["a", "--no-such"],
        ["a", "--scope"],
        ["a", "--scope", "--json"],
        ["a", "--scope=Shop"],
        ["a", "--match", "regex"],
        ["a", "--root", ""],
        ["--", "a"],
        ["a", "-lx"],
        ["-"],
    ],
)
def test_any_other_question_is_left_to_click(arguments: list[str]) -> None:
    assert plain_parameters(arguments) is None
