"""Tuples whose places have names are what typing makes of the same classes, but are made without it."""

from __future__ import annotations

import copy
import pickle
import subprocess
import sys
from typing import Any, NamedTuple

import pytest

from quillet import _named, _workspace


class Typed(NamedTuple):
    """A place."""

    line: int
    column: int = 1
    name: str | None = None

    @property
    def at(self) -> tuple[int, int]:
        return self.line, self.column


class Own(_named.NamedTuple):
    """A place."""

    line: int
    column: int = 1
    name: str | None = None

    @property
    def at(self) -> tuple[int, int]:
        return self.line, self.column


def both(use: Any) -> tuple[Any, Any]:
    """What a use of each of the classes gives, errors by their type."""

    def one(kind: Any) -> Any:
        try:
            return use(kind)
        except Exception as error:
            return type(error)

    return one(Typed), one(Own)


@pytest.mark.parametrize(
    "use",
    [
        lambda kind: tuple(kind(1)),
        lambda kind: tuple(kind(1, name="x")),
        lambda kind: tuple(kind(name="x", line=3, column=4)),
        lambda kind: kind(1, 2, "x") == (1, 2, "x"),
        lambda kind: hash(kind(1, 2)) == hash((1, 2, None)),
        lambda kind: (kind(1).line, kind(1).column, kind(1, 5).at),
        lambda kind: repr(kind(1, 2, "x")).partition("(")[2],
        lambda kind: kind(1)._asdict(),
        lambda kind: tuple(kind(1)._replace(column=8)),
        lambda kind: tuple(kind._make([1, 2, 3])),
        lambda kind: (kind._fields, kind._field_defaults, kind.__match_args__, kind.__doc__),
        lambda kind: isinstance(kind(1), tuple) and not hasattr(kind(1), "__dict__"),
        lambda kind: tuple(pickle.loads(pickle.dumps(kind(1, 2, "x")))),
        lambda kind: type(copy.deepcopy(kind(1))) is kind and type(pickle.loads(pickle.dumps(kind(1)))) is kind,
        lambda kind: [*map(kind, (1, 2), (3, 4))][1].column,
    ],
)
def test_they_do_as_those_of_typing(use: Any) -> None:
    typed, own = both(use)
    assert own == typed
    assert not isinstance(typed, type)  # an error


@pytest.mark.parametrize(
    "use",
    [
        lambda kind: kind(),
        lambda kind: kind(1, 2, 3, 4),
        lambda kind: kind(1, line=2),
        lambda kind: kind(1, other=2),
        lambda kind: kind._make([1, 2]),
        lambda kind: setattr(kind(1), "line", 2),
        lambda kind: setattr(kind(1), "other", 2),
    ],
)
def test_they_refuse_what_those_of_typing_refuse(use: Any) -> None:
    typed, own = both(use)
    assert own is typed
    assert issubclass(own, Exception)


def test_a_field_that_is_unknown_is_not_replaced() -> None:
    with pytest.raises(ValueError, match="other"):
        Own(1)._replace(other=2)


def test_they_are_matched_by_place() -> None:
    match Own(3, 4, "x"):
        case Own(line, _, name):
            assert (line, name) == (3, "x")
        case _:
            pytest.fail("no match")


def test_answers_are_of_this_kind() -> None:
    at = _workspace.Location("a.py", 1, 2, 3, None, None, "certain")
    assert isinstance(at, _named.NamedTuple)
    assert at == ("a.py", 1, 2, 3, None, None, "certain")


def test_a_first_answer_needs_none_of_the_large_modules() -> None:
    """Each of them takes as long to load as the engine."""
    pytest.importorskip("pygls")
    large = ("typing", "re", "enum", "json", "threading", "collections", "functools", "contextlib", "signal")
    code = (
        "import sys\n"
        "before = set(sys.modules)\n"
        "import quillet.server.main\n"
        f"print(*sorted((set(sys.modules) - before) & {set(large)}))"
    )
    done = subprocess.run([sys.executable, "-c", code], capture_output=True, text=True, check=True)
    assert done.stdout.split() == []
