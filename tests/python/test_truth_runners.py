"""The measurements of bench/truth read their sets as those are written, and count what they should."""

import json
import subprocess
import sys
from pathlib import Path

import pytest

from bench.truth import (
    broken,
    call_edges,
    fourslash,
    halves,
    jedi_cases,
    lsp,
    projects,
    recall,
    renames,
    tally,
    type_facts,
)
from bench.truth.engine import Answer, ByteColumn, Characters
from bench.truth.places import Call, Change, Found, Place, Texts

ROOT = Path(__file__).parents[2]


class Fake:
    """An engine that answers what it was told to."""

    name = "fake"

    def __init__(self, **answers):
        self.answers = answers
        self.opened = {}
        self.asked = []

    def __getattr__(self, question):
        if question not in ("Definitions", "References", "Types", "TypesBefore", "Complete", "Callers", "Callees"):
            raise AttributeError(question)

        def Ask(place):
            self.asked.append((question, place))
            answer = self.answers.get(question, ())
            return list(answer(place) if callable(answer) else answer)

        return Ask

    def Open(self, path, text):
        self.opened[path] = text

    def Close(self, path):
        del self.opened[path]


# --- halves and counts


def test_each_key_is_in_one_half():
    keys = [f"args/case_{number}" for number in range(200)]
    even = [key for key in keys if halves.InHalf(key, "even")]
    odd = [key for key in keys if halves.InHalf(key, "odd")]
    assert sorted(even + odd) == sorted(keys)
    assert len(even) > 60
    assert len(odd) > 60


def test_a_key_is_in_the_half_of_its_digests_last_byte():
    # printf '' | sha256sum ends in 55, printf a | sha256sum in bb, printf b | sha256sum in 9d, printf d in c4
    assert halves.InHalf("", "odd")
    assert halves.InHalf("a", "odd")
    assert halves.InHalf("d", "even")


def test_a_table_has_shares_and_says_what_misses_its_target(capsys):
    counted = tally.Tally("Title", {"good": 90, "bad": 90, "all": None}, failures=True)
    for number in range(10):
        counted.Add("good", f"case {number}", True)
        counted.Add("bad", f"case {number}", number > 4, {"x", "y"}, ())
    assert counted.Report() == 1
    shown = capsys.readouterr().out
    assert "| good | 10 | 10 | 100.0 % | 90 % |" in shown
    assert "| bad | 10 | 5 | 50.0 % | 90 % |" in shown
    assert "| all | 20 | 15 | 75.0 % |  |" in shown
    assert "bad: case 4\n  expected  x, y\n  given     nothing\n" in shown
    assert "case 5" not in shown


def test_a_target_of_which_nothing_was_measured_is_missed(capsys):
    counted = tally.Tally("Title", {"never": 1})
    assert counted.Report() == 1
    assert "nothing was measured" in capsys.readouterr().out


def test_what_is_bounded_fails_above_its_bound(capsys):
    counted = tally.Tally("Title")
    counted.Fault("wrong", "key", most=1)
    assert counted.Report() == 0
    counted.Fault("wrong", "key", most=1)
    assert counted.Report() == 1
    assert "| wrong | 2 | | | at most 1 |" in capsys.readouterr().out


# --- places


def test_columns_go_to_bytes_and_back():
    line = "é = ü + x"
    for column in range(len(line) + 1):
        assert Characters(line, ByteColumn(line, column)) == column
    assert ByteColumn(line, 4) == 6
    for column in range(len(line) + 1):
        assert lsp.FromUtf16(line + "𝒳y", lsp.Utf16(line + "𝒳y", column)) == column
    assert lsp.Utf16("𝒳y", 1) == 2


def test_open_buffers_come_before_files(tmp_path):
    path = tmp_path / "a.py"
    path.write_text("one\r\ntwo\n")
    texts = Texts()
    assert texts.Line(str(path), 2) == "two"
    texts.Open(str(path), "three")
    assert (texts.Line(str(path), 1), texts.Line(str(path), 2)) == ("three", "")
    texts.Close(str(path))
    assert texts.Line(str(path), 1) == "one"


def test_candidates_by_name_are_an_answer_where_nothing_is_stronger():
    named, likely = Found("a", 1, 0, 1, "by name"), Found("a", 2, 0, 1, "likely")
    assert Answer([named, likely]) == [likely]
    assert Answer([named]) == [named]


# --- call edges

PROGRAM = """\
import helper
from helper import Base as B, other

class A(B):
    def run(self, f=lambda: 0):
        return f()

def outer():
    def inner():
        return helper.one()
    return inner

A().run(lambda: 1)
"""


@pytest.fixture
def program(tmp_path):
    (tmp_path / "main.py").write_text(PROGRAM)
    (tmp_path / "helper.py").write_text("class Base:\n    def __init__(self): pass\ndef one(): pass\n")
    (tmp_path / "pack").mkdir()
    (tmp_path / "pack/__init__.py").write_text("def here(): pass\n")
    return call_edges.Program(tmp_path)


def test_functions_have_the_sets_names(program):
    assert {each.name for each in program.functions} == {
        "main", "main.A", "main.A.run", "main.A.run.<lambda1>", "main.outer", "main.outer.inner", "main.<lambda1>",
        "helper", "helper.Base", "helper.Base.__init__", "helper.one", "pack", "pack.here",
    }  # fmt: skip


def test_a_place_is_in_the_function_whose_body_it_is_in(program):
    main = str(program.folder / "main.py")
    assert program.Around(Place(main, 6, 15)) == "main.A.run"
    assert program.Around(Place(main, 5, 8)) == "main"  # a name in the body of a class
    assert program.Around(Place(main, 10, 15)) == "main.outer.inner"
    assert program.Around(Place(main, 11, 11)) == "main.outer"
    assert program.Around(Place(main, 13, 4)) == "main"


def test_what_is_called_has_the_sets_name(program, tmp_path):
    main = str(program.folder / "main.py")
    for found in (Found(main, 1, 0, 0, role="module", kind="module"), Found(main, 13, 4, 7)):
        assert program.Callers(Call(found, []), found) == {"main"}
    outer = Found(main, 8, 4, 9)
    assert program.Callers(Call(outer, []), outer) == {"main.outer"}
    assert program.Callers(Call(outer, [Place(main, 6, 15), Place(main, 10, 15)]), outer) == {
        "main.A.run",
        "main.outer.inner",
    }
    assert program.Name(Found(main, 8, 4, 9)) == "main.outer"
    assert program.Name(Found(main, 13, 8, 14)) == "main.<lambda1>"
    assert program.Name(Found(main, 2, 19, 23)) == "helper.Base"
    assert program.Name(Found(main, 2, 30, 35)) == "helper.other"
    assert program.Name(Found(str(program.folder / "helper.py"), 1, 6, 10)) == "helper.Base.__init__"
    assert program.Name(Found(main, 4, 6, 7)) is None  # its __init__ is not followed through an import's other name
    stub = tmp_path.parent / "builtins.pyi"
    stub.write_text("class str:\n    def upper(self): ...\ndef len(x): ...\nif x:\n    def eval(x): ...\n")
    assert program.Name(Found(str(stub), 5, 8, 12)) == "<builtin>.eval"
    assert program.Name(Found(str(stub), 2, 8, 13)) == "<builtin>.str.upper"
    assert program.Name(Found(str(stub), 3, 4, 7)) == "<builtin>.len"


def test_edges_come_from_callees_and_callers(program):
    main, helper = str(program.folder / "main.py"), str(program.folder / "helper.py")
    one = Found(helper, 3, 4, 7, "likely")

    def Callees(place):
        return [Call(one, [])] if place == Place(main, 9, 8) else []

    def Callers(place):
        if place == one.place:
            return [Call(Found(main, 9, 8, 13, "certain"), [Place(main, 10, 22)])]
        return [Call(Found(main, 8, 4, 9, "by name"), [])] if place == Place(main, 9, 8) else []

    assert call_edges.Given(program, Fake(Callees=Callees, Callers=Callers)) == {
        ("main.outer.inner", "helper.one"): "certain",
        ("main.outer", "main.outer.inner"): "by name",
    }


# --- fourslash

CASE = """\
/// <reference path="typings/fourslash.d.ts" />

// @filename: lib/__init__.py
// @library: true
//// def [|made|](a):
////     pass

// @filename: test.py
//// from lib import made
////
//// [|/*first*/made|]({|"name": "second"|}1)

{
    const wanted = helper.getRanges().filter((r) => !r.marker) as any[];
    helper.verifyFindDefinitions(
        { first: { definitions: wanted.map((r) => { return { path: r.fileName, range: helper.convertPositionRange(r)! }; }) } },
        'preferSource'
    );
    helper.openFile('x');
}
"""  # noqa: E501
LIBRARY = "env/lib/python3.13/site-packages/project/lib/__init__.py"


def test_a_case_is_read_as_files_with_marks_taken_out():
    case = fourslash.ParseCase("made.fourslash.ts", CASE)
    library = next(path for path in case.files if path.endswith("lib/__init__.py"))
    assert library.startswith("env/lib/python3.13/site-packages/lib")
    assert case.files == {
        library: "def made(a):\n    pass",
        "project/test.py": "from lib import made\n\nmade(1)",
    }
    assert [(each.file, each.begin, each.end, each.marker) for each in case.ranges] == [
        (library, 4, 8, None),
        ("project/test.py", 22, 26, 0),
    ]
    assert [(each.name, each.position) for each in case.markers] == [("first", 22), ("second", 27)]
    assert "verifyFindDefinitions" in case.script
    assert "////" not in case.script


def test_ranges_are_in_the_order_in_which_they_begin():
    case = fourslash.Case("x")
    case.AddFile("a.py", [" [|[|/*m*/x|] = y|]"])
    assert [(each.begin, each.end, each.marker) for each in case.ranges] == [(0, 5, None), (0, 1, 0)]
    assert case.files == {"a.py": "x = y"}


def StrippingNode():
    node = fourslash.FindNode()
    if node is None:
        pytest.skip("no node is found")
    asked = "process.exit(require('node:module').stripTypeScriptTypes ? 0 : 1)"
    if subprocess.run([node, "-e", asked], check=False, capture_output=True).returncode:
        pytest.skip("the node that is found does not strip types")
    return node


def test_what_a_script_expects_is_noted(tmp_path):
    node = StrippingNode()
    case = fourslash.ParseCase("made.fourslash.ts", CASE)
    wrong = fourslash.ParseCase("wrong.fourslash.ts", "//// x = 1\nhelper.getMarkerByName('none');\n")
    results = fourslash.Expectations([case, wrong], node)
    assert "no marker none" in results["wrong.fourslash.ts"]["error"]
    [call] = results["made.fourslash.ts"]["calls"]
    assert (call["verb"], call["filter"]) == ("verifyFindDefinitions", "preferSource")
    fourslash.WriteProject(case, tmp_path)
    library = next(path for path in case.files if path.endswith("lib/__init__.py"))
    stub = str(tmp_path / "project/typings/lib.pyi")
    engine = Fake(Definitions=[Found(stub, 1, 4, 8), Found(str(tmp_path / library), 1, 4, 8)])
    asked = fourslash.Asked(case, tmp_path, engine)
    expected = asked.Expected(call["expected"]["first"]["definitions"])
    assert expected == {f"{library}:1:4"}
    assert asked.Given("verifyFindDefinitions", "first", {}, "preferSource") == expected
    assert asked.Given("verifyFindDefinitions", "first", {}, "preferStubs") == {"project/typings/lib.pyi:1:4"}
    assert len(asked.Given("verifyFindDefinitions", "first", {}, None)) == 2
    assert engine.asked[0] == ("Definitions", Place(str(tmp_path / "project/test.py"), 3, 0))


# --- jedi's cases

COMMENTED = """\
x = 3
#? int()
x
#? 1 ['upper']
"".u
#! ["x = 3"]
x
#< (-6,0), (0,0)
x
# python >= 3.12
#?
type Y = x
"""


def test_cases_are_read_from_comments():
    cases = list(jedi_cases.ParseCases("a.py", COMMENTED.split("\n")))
    assert [(case.kind, case.expected, case.line, case.column) for case in cases] == [
        ("types", "int()", 2, 1),
        ("completions", "['upper']", 4, 1),
        ("definitions", '["x = 3"]', 6, 1),
        ("references", "(-6,0), (0,0)", 8, 1),
        ("types", "", 11, 10),
    ]
    assert [jedi_cases.IsFor(case, (3, 11)) for case in cases] == [True, True, True, True, False]
    assert jedi_cases.IsFor(cases[-1], (3, 13))


def test_only_the_cases_of_a_half_are_read():
    lines = COMMENTED.split("\n")
    found = [[*jedi_cases.ParseCases("a.py", lines, half)] for half in ("even", "odd")]
    assert sorted(case.line for half in found for case in half) == [2, 4, 6, 8, 11]
    for half, cases in zip(("even", "odd"), found, strict=True):
        for case in cases:
            kind = {"definitions": "!", "references": "<"}.get(case.kind, "?")
            assert halves.InHalf(jedi_cases.Key("a.py", kind, case.line), half)


@pytest.mark.parametrize(
    ("expected", "given", "same"),
    [
        ("int()", ["builtins.int"], True),
        ("int()", ["type[builtins.int]"], False),
        ("int", ["type[builtins.int]"], True),
        ("int() str()", ["builtins.str", "builtins.int"], True),
        ("int() str()", ["builtins.int"], False),
        ("int()", ["builtins.int", "builtins.str"], False),
        ("list()", ["builtins.list[builtins.int]"], True),
        ("None", ["None"], True),
        ("", [], True),
        ("", ["typing.Any"], True),
        ("", ["builtins.int"], False),
        ("os.path.join", ["def (a: str) -> str"], True),
        ("int()", ["def (a: str) -> str"], False),
        ("pack.mod", ["module pack.mod"], True),
        ("Foo()", ["a.Foo"], True),
    ],
)
def test_types_are_compared_by_the_last_part_of_their_names(expected, given, same):
    assert jedi_cases.SameTypes(expected.split(), given) is same


def test_references_may_have_any_line():
    expected = jedi_cases.ExpectedPlaces("(-1,2), ('pack.mod', 4, 0), ('stub:socket', ..., 6)", "a", 10)
    assert expected == [("a", 9, 2), ("pack.mod", 4, 0), ("stub:socket", None, 6)]
    assert jedi_cases.SamePlaces(expected, {("a", 9, 2), ("pack.mod", 4, 0), ("stub:socket", 77, 6)})
    assert not jedi_cases.SamePlaces(expected, {("a", 9, 2), ("pack.mod", 4, 0)})
    assert not jedi_cases.SamePlaces(expected, {("a", 9, 2), ("pack.mod", 4, 0), ("stub:socket", 77, 6), ("b", 1, 1)})


def test_a_definition_is_described_in_the_sets_words():
    pytest.importorskip("parso")
    lines = ["def f(a, b=3): pass", "x = [1,", "     2]", "class C: pass", "for y in x: y"]
    assert jedi_cases.Describe(Found("m.py", 1, 4, 5, kind="function"), lines) == "def f"
    assert jedi_cases.Describe(Found("m.py", 4, 6, 7, kind="class"), lines) == "class C"
    assert jedi_cases.Describe(Found("m.py", 1, 6, 7, kind="parameter"), lines) == "param a"
    assert jedi_cases.Describe(Found("m.py", 1, 9, 10, kind="parameter"), lines) == "param b=3"
    assert jedi_cases.Describe(Found("m.py", 2, 0, 1, kind="variable"), lines) == "x = [1, 2]"
    assert jedi_cases.Describe(Found("m.py", 5, 4, 5, kind="variable"), lines) == "for y in x: y"
    assert jedi_cases.Describe(Found("p/__init__.py", 1, 0, 0, kind="module"), []) == "module p"


def test_an_expected_expression_is_asked_in_a_line_before_the_case(tmp_path):
    path = tmp_path / "a.py"
    path.write_text("def f():\n    x = 1\n    #? g.made()\n    x\n")
    seen = []

    def Types(place):
        seen.append((place, engine.opened[str(path)].split("\n")[place.line - 1]))
        return ["m.Thing"]

    engine = Fake(TypesBefore=["m.Thing"], Types=Types)
    [case] = jedi_cases.ParseCases("a.py", path.read_text().split("\n"))
    right, _, _ = jedi_cases.Questions(tmp_path, path, engine).Ask(case)
    assert right
    assert seen == [(Place(str(path), 4, 4), "    expected_ = g.made()")]
    assert engine.asked[0] == ("TypesBefore", Place(str(path), 4, 5))
    assert not engine.opened


def test_completions_are_those_that_begin_as_what_is_typed(tmp_path):
    path = tmp_path / "a.py"
    path.write_text("#? ['upper', 'Up']\n''.up\n")
    [case] = jedi_cases.ParseCases("a.py", path.read_text().split("\n"))
    for names, right in ((["upper", "Up=", "lower"], True), (["upper"], False), (["upper", "Up", "upx"], False)):
        assert jedi_cases.Questions(tmp_path, path, Fake(Complete=names)).Ask(case)[0] is right


# --- type facts


def test_what_functions_return_stands_behind_their_last_arrow():
    assert type_facts.Returned(["def (f: def (x: int) -> str, g) -> builtins.int | None"]) == ["builtins.int", "None"]
    assert type_facts.Returned(["def () -> dict[str, int | None]"]) == ["dict[str, int | None]"]
    assert type_facts.Returned(["def () -> def () -> builtins.int"]) == ["def () -> builtins.int"]
    assert type_facts.Returned(["async def () -> (def () -> builtins.int) | None"]) == [
        "def () -> builtins.int",
        "None",
    ]
    assert type_facts.Returned(["builtins.int", "def (a)"]) == []


@pytest.mark.parametrize(
    ("expected", "given", "agree"),
    [
        (["int"], ["builtins.int"], True),
        (["int"], [], False),
        (["int"], ["builtins.int", "builtins.str"], False),
        (["int", "str"], ["builtins.int"], False),
        (["callable"], ["def () -> None"], True),
        (["Nonetype"], ["None"], True),
        (["list"], ["builtins.list[builtins.int]"], True),
        (["pack.A"], ["pack.A"], True),
        (["A"], ["main.BA"], False),
    ],
)
def test_facts_agree(expected, given, agree):
    assert type_facts.Agree(expected, given) is agree


def test_an_item_is_asked_for_behind_its_statement(tmp_path):
    path = tmp_path / "main.py"
    path.write_text("def f():\n    x = [\n        1]\n    return x\n")
    seen = []

    def Types(place):
        seen.append((place.line, place.column, engine.opened[str(path)].split("\n")[place.line - 1]))
        return ["builtins.int"]

    engine = Fake(Types=Types)
    assert type_facts.Types(engine, path, {"line_number": 2, "col_offset": 5, "variable": "x[0]"}) == ["builtins.int"]
    assert seen == [(4, 4, "    asked_ = x[0]")]


def test_other_facts_are_asked_for_where_they_stand(tmp_path):
    engine = Fake(Types=["def () -> builtins.str"])
    path = tmp_path / "main.py"
    assert type_facts.Types(engine, path, {"line_number": 2, "col_offset": 5, "function": "f"}) == ["builtins.str"]
    type_facts.Types(engine, path, {"line_number": 3, "col_offset": 1, "variable": "self.x"})
    assert [place for _, place in engine.asked] == [Place(str(path), 2, 4), Place(str(path), 3, 5)]


# --- projects, recall, broken sources, renames


def test_names_are_grouped_by_what_they_are_taken_from(tmp_path):
    path = tmp_path / "a.py"
    path.write_text("class A:\n    def f(self):\n        return self.é.x + A.f(k=1)  # A\n")
    found = [
        (name.text, name.group, name.place.column) for name in projects.Names(path) if name.role in ("read", "call")
    ]
    assert found == [
        ("self", projects.PLAIN, 15),
        ("é", projects.OWN, 20),
        ("x", projects.OTHER, 22),
        ("A", projects.PLAIN, 26),
        ("f", projects.OTHER, 28),
    ]


def test_sources_of_a_project_are_its_own(tmp_path):
    for name in ("b.py", "a.py", "build/c.py", "deep/d.py", "e.txt"):
        (tmp_path / name).parent.mkdir(exist_ok=True)
        (tmp_path / name).write_text("")
    (tmp_path / "link.py").symlink_to(tmp_path / "a.py")
    assert [path.name for path in projects.SourceFiles(tmp_path)] == ["a.py", "b.py", "d.py"]


def test_a_sample_takes_equally_of_each_group(tmp_path):
    (tmp_path / "a.py").write_text("".join(f"a{i}\nself.b{i}\nc.d{i}\n" for i in range(50)))
    names = projects.SampleNames(tmp_path, 30, 1)
    groups = [name.group for name in names]
    assert [groups.count(group) for group in (projects.PLAIN, projects.OWN, projects.OTHER)] == [10, 10, 10]
    assert names == projects.SampleNames(tmp_path, 30, 1) != projects.SampleNames(tmp_path, 30, 2)


def test_methods_defined_once_have_every_attribute_of_their_name(tmp_path):
    (tmp_path / "a.py").write_text(
        "class A:\n    def once(self): pass\n    def twice(self): pass\n"
        "    def append(self): pass\n    def unused(self): pass\n"
        "class B:\n    twice = 1\n    def g(self, a):\n        a.once(); a.twice(); a.append(); self.once\n"
    )
    [method] = recall.MethodsDefinedOnce(tmp_path)
    assert method.definition.text == "once"
    assert [use.place[1:] for use in method.uses] == [(9, 10), (9, 46)]


BREAKABLE = "import os\nx = (1,\n     2)\ny = x\n"


def test_a_deleted_token_moves_what_stands_behind_it():
    tokens = broken.Tokens(BREAKABLE)
    comma = next(token for token in tokens if token.text == ",")
    assert (comma.first, comma.last) == (2, 3)
    deleted = broken.Delete(BREAKABLE, comma)
    assert deleted.text == "import os\nx = (1\n     2)\ny = x\n"
    assert [deleted.Moved(line, 0) for line in (1, 2, 3, 4)] == [(1, 0), None, None, (4, 0)]
    string = next(token for token in broken.Tokens('a = """b\nc"""\nd\n') if token.text.startswith('"'))
    deleted = broken.Delete('a = """b\nc"""\nd\n', string)
    assert deleted.text == "a = \nd\n"
    assert deleted.Moved(3, 0) == (2, 0)


def test_a_file_that_is_cut_has_nothing_behind_the_cut():
    one = next(token for token in broken.Tokens(BREAKABLE) if token.text == "1")
    cut = broken.CutBehind(BREAKABLE, one)
    assert cut.text == "import os\nx = (1"
    assert [cut.Moved(line, 0) for line in (1, 2, 4)] == [(1, 0), None, None]


def test_only_what_can_stay_the_same_is_expected():
    cut = broken.CutBehind(BREAKABLE, broken.Tokens(BREAKABLE)[1])
    assert broken.Expected([Found("b.py", 9, 1, 2)], cut, "a.py") == {Place("b.py", 9, 1)}
    assert broken.Expected([Found("a.py", 4, 0, 1)], cut, "a.py") is None


def test_edits_of_a_line_do_not_move_each_other(tmp_path):
    path = tmp_path / "a.py"
    path.write_bytes(b"x = x + 1\r\ny = x\r\n")
    changes = [
        Change(str(path), 1, 0, 1, "long"),
        Change(str(path), 1, 4, 5, "long"),
        Change(str(path), 2, 4, 5, "long"),
    ]
    assert renames.Apply(changes) == {str(path): "long = long + 1\r\ny = long\r\n"}


def test_what_does_not_compile_is_said():
    assert renames.Compiles("x = 1\n") is None
    assert renames.Compiles("x = \n")
    assert renames.Compiles("def f(a):\n    global a\n")  # which only a compiler sees


# --- language servers

SERVER = """\
import json, sys

def read():
    length = 0
    while (line := sys.stdin.buffer.readline()) != b"\\r\\n":
        if not line:
            sys.exit()
        if line.startswith(b"Content-Length"):
            length = int(line.split(b":")[1])
    return json.loads(sys.stdin.buffer.read(length))

def write(**message):
    body = json.dumps({"jsonrpc": "2.0", **message}).encode()
    sys.stdout.buffer.write(b"Content-Length: %d\\r\\n\\r\\n" % len(body) + body)
    sys.stdout.buffer.flush()

opened = {}
while True:
    message = read()
    method, given = message.get("method"), message.get("params")
    if method == "initialize":
        write(id="s1", method="workspace/configuration", params={"items": [{}, {}]})
        assert read()["result"] == [{}, {}]
        write(id=message["id"], result={})
    elif method == "textDocument/didOpen":
        opened[given["textDocument"]["uri"]] = given["textDocument"]["text"]
    elif method == "textDocument/didChange":
        change = given["contentChanges"][0]
        assert change["range"]["start"] == {"line": 0, "character": 2}, change
        opened[given["textDocument"]["uri"]] = change["text"]
    elif method == "textDocument/definition":
        at = given["position"]
        span = {"start": at, "end": {"line": at["line"], "character": at["character"] + 1}}
        write(id=message["id"], result={"uri": given["textDocument"]["uri"], "range": span})
    elif method == "textDocument/references":
        write(id=message["id"], error={"message": "no"})
    elif method == "textDocument/completion":
        write(id=message["id"], result={"items": [{"label": text} for text in opened.values()]})
    elif method == "shutdown":
        write(id=message["id"], result=None)
    elif method == "exit":
        sys.exit()
"""


def test_a_language_server_is_asked_and_told(tmp_path):
    (tmp_path / "server.py").write_text(SERVER)
    path = str(tmp_path / "a b.py")
    Path(path).write_text("𝒳 = x\n", "utf-8")
    with lsp.LanguageServer("made", [sys.executable, str(tmp_path / "server.py")], tmp_path, timeout=30) as server:
        server.Open(path)
        assert server.Definitions(Place(path, 1, 4)) == [Found(path, 1, 4, 5)]
        assert server.References(Place(path, 1, 4)) == []
        assert server.refused == 1
        assert server.Complete(Place(path, 1, 4)) == ["𝒳 = x\n"]
        server.Type(path, Place(path, 1, 1), "y")
        assert server.Complete(Place(path, 1, 4)) == ["y"]
        usage = server.usage.Look()
        assert usage.peak_kib > 1000
        assert usage.seconds >= 0


def test_a_server_that_ends_is_an_error(tmp_path):
    with pytest.raises(lsp.ServerError, match="ended"):
        lsp.LanguageServer("made", [sys.executable, "-c", ""], tmp_path, timeout=30)


# --- the command


def test_every_runner_says_how_its_set_is_got():
    done = subprocess.run(
        [sys.executable, "-m", "bench.truth", "--help"], cwd=ROOT, capture_output=True, text=True, check=False
    )
    assert done.returncode == 0, done.stderr
    for runner in ("pycg", "pyright", "jedi", "typeeval"):
        assert runner in done.stdout
        shown = subprocess.run(
            [sys.executable, "-m", "bench.truth", runner, "--help"],
            cwd=ROOT,
            capture_output=True,
            text=True,
            check=True,
        ).stdout
        assert "git clone" in shown or "pip download" in shown


def test_a_run_leaves_the_other_half_unread(tmp_path, monkeypatch, capsys):
    for number in range(12):
        folder = tmp_path / f"set/case_{number}"
        folder.mkdir(parents=True)
        (folder / "main.py").write_text("def f(): pass\nf()\n")
        (folder / "callgraph.json").write_text(json.dumps({"main": ["main.f"]}))
    read = set()
    plain = Path.open

    def Reading(path, *given, **named):
        read.add(path.parent.name)
        return plain(path, *given, **named)

    monkeypatch.setattr(Path, "open", Reading)
    monkeypatch.setitem(call_edges.ENGINES, "quillet", lambda roots: Fake())
    parser_options = type(
        "Options", (), {"folder": tmp_path / "set", "half": "even", "engine": "quillet", "failures": False}
    )
    assert call_edges.Run(parser_options) == 1
    wanted = {f"case_{number}" for number in range(12) if halves.InHalf(f"case_{number}", "even")}
    assert f"| edges | {len(wanted)} | 0 |" in capsys.readouterr().out
    assert read & {f"case_{number}" for number in range(12)} == wanted
