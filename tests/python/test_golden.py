"""The golden files agree with the code, and between them show every node class and record kind.

`./run golden` rewrites them; the diff is what to review.
"""

from __future__ import annotations

import re
from pathlib import Path

import pytest

import golden
from quillet import RecordKind

ROOT = Path(__file__).resolve().parent.parent.parent
FILES = golden.files()
CASES = [
    pytest.param(path, case, id=f"{path.stem}: {case.head.removeprefix('=== ')}")
    for path in FILES
    for case in golden.read(path)[1]
]

# Classes that no parse makes: bases, and classes kept for hosts that name them. `pass_stmt` has one child
# and is no node; one logical line holds one decorator.
NEVER_MADE = {
    "CStmt",
    "CTestExpr",
    "CBinaryOp",
    "CMappingPatternNode",
    "CPassStmt",
    "CMultipleDecorators",
}


def test_there_are_golden_files(request: pytest.FixtureRequest) -> None:
    if request.config.getoption("--write-golden"):
        for path in FILES:
            golden.write(path)
    assert len(CASES) > 100


@pytest.mark.parametrize(("path", "case"), CASES)
def test_golden(path: Path, case: golden.Case, request: pytest.FixtureRequest) -> None:
    if request.config.getoption("--write-golden"):
        return
    assert case.expected == case.actual()
    assert path.name.startswith("fail_") == case.expected.startswith("--- error")


def test_each_title_stands_once_in_its_file() -> None:
    for path in FILES:
        heads = [case.head for case in golden.read(path)[1]]
        assert len(heads) == len(set(heads)), path.name


def shown_in_trees() -> set[str]:
    found = set()
    for path in FILES:
        for case in golden.read(path)[1]:
            tree = case.expected.split("--- records")[0]
            found |= set(re.findall(r"^ *(C\w+) ", tree, re.MULTILINE))
    return found


def test_every_node_class_that_a_parse_makes_is_in_a_golden_file() -> None:
    rows = (ROOT / "core/tree/node_kinds.def").read_text()
    classes = set(re.findall(r"^QUILLET_NODE(?:_BASE)?\((\w+),", rows, re.MULTILINE))
    assert len(classes) > 50
    assert classes - shown_in_trees() == NEVER_MADE


def test_every_record_kind_that_the_walkers_write_is_in_a_golden_file() -> None:
    text = "".join(path.read_text() for path in FILES)
    rows = (ROOT / "core/vocabulary/kinds.def").read_text().split("// What consumers")[0]
    kinds = re.findall(r"^QUILLET_INFO_KIND\(\w+, '(.)'\)", rows, re.MULTILINE)
    assert len(kinds) > 10
    assert [kind for kind in kinds if not re.search(rf"^\S+ +:{re.escape(kind)}:", text, re.MULTILINE)] == []


def test_every_decoded_kind_is_in_a_golden_file() -> None:
    cases = [case for path in FILES for case in golden.read(path)[1]]
    records = "".join(case.expected.partition("--- records\n")[2] for case in cases)
    missing = [kind.value for kind in RecordKind if not re.search(rf"\b{kind.value}\b", records)]
    assert missing == ["other"]
