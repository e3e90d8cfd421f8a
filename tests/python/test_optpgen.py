"""The table generator and the parser engine as a host sees them."""

from __future__ import annotations

import gc
import pickle
import re
import threading
import weakref
from pathlib import Path
from typing import Any

import pytest

from quillet import optpgen

GRAMMARS = Path(__file__).resolve().parent.parent.parent / "resources" / "pgen-grammars"

NAME, NUMBER, NEWLINE, ENDMARKER, EQUAL, PLUS = 1, 2, 4, 0, 22, 14
LINE = [(NAME, "a"), (EQUAL, "="), (NAME, "b"), (PLUS, "+"), (NUMBER, "1"), (NEWLINE, "\n"), (ENDMARKER, None)]

Node = tuple[int, Any, Any, Any]


@pytest.fixture(scope="module")
def grammar() -> optpgen.Grammar:
    return optpgen.ParserGenerator(str(GRAMMARS / "Python-Grammar-3.8")).make_grammar()


def small_grammar(tmp_path: Path, text: str, **numbers: Any) -> optpgen.Grammar:
    path = tmp_path / "small"
    path.write_text(text)
    return optpgen.ParserGenerator(str(path), **numbers).make_grammar()


def parse(parser: optpgen.Parser, start: int, tokens: list[tuple[int, str | None]]) -> Any:
    parser.setup(start)
    for context, (type_, value) in enumerate(tokens):
        parser.addtoken(type_, value, context)
    return parser.finish()


# ---- grammars ----


@pytest.mark.parametrize("version", ["2.7", "3.8"])
def test_grammar_objects_number_the_rules_of_the_file(version: str) -> None:
    made = optpgen.ParserGenerator(GRAMMARS / f"Python-Grammar-{version}").make_grammar()
    assert made.symbol2number["file_input"] == 256
    assert min(made.number2symbol) == 256
    assert {number: name for name, number in made.symbol2number.items()} == made.number2symbol
    assert sorted(made.dfas) == sorted(made.number2symbol)
    assert made.symbol2number is made.symbol2number
    assert (NAME, "if") in made.labels
    assert (NAME, None) in made.labels


def test_dfas_say_what_a_rule_may_be(tmp_path: Path) -> None:
    made = small_grammar(tmp_path, "a: b ['+']\nb: NAME\n")
    assert made.labels == [(PLUS, None), (NAME, None)]
    assert made.dfas == {256: [([(257, 1)], False), ([(0, 2)], True), ([], True)], 257: [([(1, 1)], False), ([], True)]}


def test_numbers_of_the_host_are_taken(tmp_path: Path) -> None:
    made = small_grammar(tmp_path, "a: WORD '=?='\n", tok_number2name={90: "WORD"}, op_text2number={"=?=": 200})
    parser = optpgen.CreateParser(made, None)
    assert parse(parser, 256, [(90, "x"), (200, "=?=")]) == (256, None, 0, [(90, "x", 0, None), (200, "=?=", 1, None)])
    with pytest.raises(ValueError, match="no token is named 'NAME'"):
        small_grammar(tmp_path, "a: NAME\n", tok_number2name={90: "WORD"})


def test_a_missing_grammar_file_is_named(tmp_path: Path) -> None:
    with pytest.raises(OSError, match="no-such-file"):
        optpgen.ParserGenerator(str(tmp_path / "no-such-file"))
    with pytest.raises(OSError, match=str(tmp_path)):
        optpgen.ParserGenerator(str(tmp_path))


def test_a_bad_grammar_says_where_and_why(tmp_path: Path) -> None:
    message = f"{tmp_path / 'small'}:1: rule 's' is not LL(1): NAME begins both a and b"
    with pytest.raises(ValueError, match=f"^{re.escape(message)}$"):
        small_grammar(tmp_path, "s: a | b\na: NAME '+'\nb: NAME '-'\n")


@pytest.mark.parametrize(
    "arguments",
    [(None,), (7,), ("g", 3), ("g", {1: 2}), ("g", {"NAME": 1}), ("g", None, {3: "+"}), ("g", None, [])],
    ids=str,
)
def test_wrong_arguments_of_the_generator_are_type_errors(arguments: tuple[Any, ...]) -> None:
    with pytest.raises(TypeError):
        optpgen.ParserGenerator(*arguments)


# ---- raw tuples ----


def test_without_a_converter_nodes_are_tuples(grammar: optpgen.Grammar) -> None:
    number = grammar.symbol2number
    root = parse(optpgen.CreateParser(grammar, None), number["file_input"], LINE)
    total = (
        number["arith_expr"],
        None,
        2,
        [(NAME, "b", 2, None), (PLUS, "+", 3, None), (NUMBER, "1", 4, None)],
    )
    statement = (number["expr_stmt"], None, 0, [(NAME, "a", 0, None), (EQUAL, "=", 1, None), total])
    line = (number["simple_stmt"], None, 0, [statement, (NEWLINE, "\n", 5, None)])
    assert root == (number["file_input"], None, 0, [line, (ENDMARKER, None, 6, None)])


def test_a_value_comes_back_as_the_same_object(grammar: optpgen.Grammar) -> None:
    value = "".join(["some", "name"])
    root = parse(optpgen.CreateParser(grammar, None), grammar.symbol2number["testlist"], [(NAME, value)])
    assert root == (NAME, value, 0, None)
    assert root[1] is value


def test_values_of_any_text_are_taken(grammar: optpgen.Grammar) -> None:
    for value in ("", "é", "\ud800", "a\0b"):
        root = parse(optpgen.CreateParser(grammar, None), grammar.symbol2number["testlist"], [(NAME, value)])
        assert root[1] == value


def test_without_promotion_each_rule_is_a_node(tmp_path: Path) -> None:
    made = small_grammar(tmp_path, "a: b ['+' b]\nb: NAME\n")
    leaf = (NAME, "x", 0, None)
    assert parse(optpgen.CreateParser(made, None), 256, [(NAME, "x")]) == leaf
    kept = optpgen.CreateParser(made, None, promotesinglechild=False)
    assert parse(kept, 256, [(NAME, "x")]) == (256, None, 0, [(257, None, 0, [leaf])])


def test_deep_input_needs_no_machine_stack(grammar: optpgen.Grammar) -> None:
    parser = optpgen.CreateParser(grammar, None)
    parser.setup(grammar.symbol2number["testlist"])
    depth = 100_000
    for _ in range(depth):
        parser.addtoken(7, "(", 0)
    parser.addtoken(NAME, "x", 0)
    for _ in range(depth):
        parser.addtoken(8, ")", 0)
    node = parser.finish()
    for _ in range(depth):
        node = node[3][1]
    assert node == (NAME, "x", 0, None)


# ---- converters ----


class Recorder(optpgen.NodeConverter):
    """Writes down what it is called with; its nodes are texts."""

    def __init__(self) -> None:
        self.calls: list[tuple[int, str | None, int, Any]] = []

    def convert(self, node_type: int, value: str | None, context: int, children: list[str] | None) -> str:
        self.calls.append((node_type, value, context, children))
        return str(value) if children is None else f"({' '.join(children)})"


def test_a_converter_is_called_at_each_token_and_each_rules_end(grammar: optpgen.Grammar) -> None:
    recorder = Recorder()
    parser = optpgen.CreateParser(grammar, recorder)
    parser.setup(grammar.symbol2number["testlist"])
    parser.addtoken(NAME, "a", 10)
    assert recorder.calls == [(NAME, "a", 10, None)]
    parser.addtoken(PLUS, "+", 11)
    parser.addtoken(NAME, "b", 12)
    assert len(recorder.calls) == 3
    assert parser.finish() == "(a + b)"
    assert recorder.calls[3:] == [(grammar.symbol2number["arith_expr"], None, 10, ["a", "+", "b"])]


def test_the_base_converter_converts_nothing() -> None:
    with pytest.raises(NotImplementedError) as caught:
        optpgen.NodeConverter().convert(1, "x", 0, None)
    assert caught.value.args == ()


@pytest.mark.parametrize("failing", range(12))
def test_what_a_converter_raises_comes_out_and_setup_recovers(grammar: optpgen.Grammar, failing: int) -> None:
    class Failing(Recorder):
        failing = -1

        def convert(self, node_type: int, value: str | None, context: int, children: list[str] | None) -> str:
            if len(self.calls) == self.failing:
                raise KeyError("none of that")
            return super().convert(node_type, value, context, children)

    converter = Failing()
    parser = optpgen.CreateParser(grammar, converter)
    start = grammar.symbol2number["file_input"]
    whole = parse(parser, start, LINE)
    assert len(converter.calls) == 11
    converter.calls.clear()
    converter.failing = failing
    if failing < 11:
        with pytest.raises(KeyError, match="none of that"):
            parse(parser, start, LINE)
        with pytest.raises(optpgen.ParseError):
            parser.addtoken(NAME, "x", 0)
    converter.calls.clear()
    converter.failing = -1
    assert parse(parser, start, LINE) == whole


def test_nodes_of_a_failed_parse_are_let_go(grammar: optpgen.Grammar) -> None:
    class Thing:
        pass

    class Things(optpgen.NodeConverter):
        def __init__(self) -> None:
            self.made: list[weakref.ref[Thing]] = []

        def convert(self, node_type: int, value: str | None, context: int, children: list[Thing] | None) -> Thing:
            thing = Thing()
            thing.children = children  # type: ignore[attr-defined]
            self.made.append(weakref.ref(thing))
            return thing

    converter = Things()
    parser = optpgen.CreateParser(grammar, converter)
    start = grammar.symbol2number["file_input"]
    with pytest.raises(optpgen.ParseError):
        parse(parser, start, [*LINE[:5], (NAME, "c")])
    assert any(made() is not None for made in converter.made)
    parser.setup(start)
    assert all(made() is None for made in converter.made)
    parse(parser, start, LINE)
    parser.setup(start)
    parser.addtoken(NAME, "x", 0)
    del parser
    assert all(made() is None for made in converter.made)


def test_a_parser_and_its_converter_may_hold_each_other(grammar: optpgen.Grammar) -> None:
    recorder = Recorder()
    recorder.parser = optpgen.CreateParser(grammar, recorder)  # type: ignore[attr-defined]
    gone = weakref.ref(recorder)
    del recorder
    gc.collect()
    assert gone() is None


def test_a_converter_may_not_call_its_parser(grammar: optpgen.Grammar) -> None:
    class Meddler(Recorder):
        def convert(self, node_type: int, value: str | None, context: int, children: list[str] | None) -> str:
            parser.setup(256)
            return ""

    parser = optpgen.CreateParser(grammar, Meddler())
    with pytest.raises(RuntimeError, match="the parser is in use"):
        parse(parser, 256, LINE)


def test_one_grammar_serves_parsers_in_threads(grammar: optpgen.Grammar) -> None:
    start = grammar.symbol2number["file_input"]
    expected = parse(optpgen.CreateParser(grammar, None), start, LINE)
    agreed: list[bool] = []

    def work() -> None:
        parser = optpgen.CreateParser(grammar, None)
        agreed.append(all(parse(parser, start, LINE) == expected for _ in range(500)))

    threads = [threading.Thread(target=work) for _ in range(4)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    assert agreed == [True] * 4


# ---- errors ----


def test_a_token_out_of_place_is_a_parse_error(grammar: optpgen.Grammar) -> None:
    parser = optpgen.CreateParser(grammar, None)
    parser.setup(grammar.symbol2number["file_input"])
    parser.addtoken(NAME, "if", 0)
    with pytest.raises(optpgen.ParseError) as caught:
        parser.addtoken(NAME, "while", 41)
    assert (caught.value.msg, caught.value.type, caught.value.value, caught.value.context) == (
        "bad input",
        NAME,
        "while",
        41,
    )


def test_other_parse_errors(grammar: optpgen.Grammar) -> None:
    parser = optpgen.CreateParser(grammar, None)
    start = grammar.symbol2number["file_input"]
    with pytest.raises(optpgen.ParseError) as caught:
        parse(parser, start, [(57, "?")])
    assert (caught.value.msg, caught.value.type, caught.value.context) == ("bad token", 57, 0)
    with pytest.raises(optpgen.ParseError) as caught:
        parse(parser, start, [*LINE, (NAME, "x")])
    assert (caught.value.msg, caught.value.value, caught.value.context) == ("too much input", "x", 7)
    with pytest.raises(optpgen.ParseError) as caught:
        parse(parser, start, LINE[:-1])
    assert (caught.value.msg, caught.value.type, caught.value.value, caught.value.context) == (
        "incomplete input",
        None,
        None,
        None,
    )
    with pytest.raises(optpgen.ParseError) as caught:
        parse(parser, start, [(6, None)])
    assert (caught.value.value, caught.value.context) == (None, 0)


def test_parse_errors_are_made_of_four_things_and_pickle() -> None:
    error = optpgen.ParseError("bad input", 1, "x", 3)
    assert (error.msg, error.type, error.value, error.context) == ("bad input", 1, "x", 3)
    assert isinstance(error, Exception)
    assert "bad input" in str(error)
    copy = pickle.loads(pickle.dumps(error))
    assert (copy.msg, copy.type, copy.value, copy.context) == ("bad input", 1, "x", 3)
    with pytest.raises(TypeError):
        optpgen.ParseError("bad input")  # type: ignore[call-arg]


def test_nothing_is_taken_before_setup(grammar: optpgen.Grammar) -> None:
    parser = optpgen.CreateParser(grammar, None)
    with pytest.raises(optpgen.ParseError):
        parser.addtoken(NAME, "x", 0)
    with pytest.raises(optpgen.ParseError):
        parser.finish()
    with pytest.raises(ValueError, match="no symbol has the number 12"):
        parser.setup(12)


def test_wrong_arguments_of_parsers_are_type_errors(grammar: optpgen.Grammar) -> None:
    with pytest.raises(TypeError, match="Expected Grammar, got dict"):
        optpgen.CreateParser({}, None)  # type: ignore[arg-type]
    with pytest.raises(TypeError, match="Expected Grammar, got NoneType"):
        optpgen.CreateParser(None, None)  # type: ignore[arg-type]
    with pytest.raises(TypeError, match="Expected NodeConverter, got int"):
        optpgen.CreateParser(grammar, 3)  # type: ignore[arg-type]
    parser = optpgen.CreateParser(grammar, None)
    parser.setup(grammar.symbol2number["file_input"])
    with pytest.raises(TypeError, match="Expected str, got bytes"):
        parser.addtoken(NAME, b"x", 0)  # type: ignore[arg-type]
    with pytest.raises(TypeError, match="an integer is required"):
        parser.addtoken("NAME", "x", 0)  # type: ignore[arg-type]
    with pytest.raises(TypeError, match="an integer is required"):
        parser.addtoken(NAME, "x", (0, 1))  # type: ignore[arg-type]
    with pytest.raises(OverflowError):
        parser.addtoken(1 << 40, "x", 0)
    parser.addtoken(NAME, "x", 0)
    parser.addtoken(NEWLINE, "\n", 1)
    parser.addtoken(ENDMARKER, None, 2)
    assert parser.finish()[3][0][3][0] == (NAME, "x", 0, None)
