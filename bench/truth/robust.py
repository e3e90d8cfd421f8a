"""Every question at every place: none may raise, and none may take long.

Asked in random files of real projects at each name and between, and in projects that are made for harm: rings of links,
modules that import themselves, classes that inherit from themselves, and chains of ten thousand links.
"""

from __future__ import annotations

import argparse
import random
import tempfile
import time
from collections.abc import Iterator
from pathlib import Path
from typing import Any

from bench.truth.engine import QuilletEngine
from bench.truth.places import Cut, ReadText
from bench.truth.projects import HOW_TO_GET, SourceFiles
from bench.truth.tally import AddFailures, Tally

QUESTIONS = ("definitions", "types", "hover", "signatures", "complete", "callees", "callers", "supertypes", "subtypes")
WHOLE_PROJECT = ("references",)
OF_A_FILE = ("outline", "problems")
CHAIN = 10_000


def Chains() -> dict[str, str]:
    """Sources by what they are made to meet. Each ends in the name that a question is worst for."""
    links = range(CHAIN)
    few = range(CHAIN // 10)
    return {
        "classes that inherit from themselves": (
            "class A(A): pass\nclass B(C): x = 1\nclass C(B): pass\nclass D(D.E): pass\nA().x\nD.e\nC.x\nB().y\n"
        ),
        "a base that is a call of the class": (
            "class A(A()): pass\nclass B(f(B)): pass\ndef f(x): return x\nA.z\nB().y\n"
        ),
        "functions that return themselves": (
            "def f(): return f()\ndef g(): return h()\ndef h(): return [g]\nf().x\ng()[0].y\n"
        ),
        "types without end": ("x = 1\nfor i in range(9):\n    x = [x]\nx[0][0].y\ndef f(a): return f([a])\nf(1).z\n"),
        "a chain of names": "n0 = 1\n" + "".join(f"n{i + 1} = n{i}\n" for i in links) + f"n{CHAIN}\n",
        "a chain of names backwards": "".join(f"n{i} = n{i + 1}\n" for i in links) + f"n{CHAIN} = 1\nn0\n",
        "a chain of calls": (
            "def f0(): return 1\n" + "".join(f"def f{i + 1}(): return f{i}()\n" for i in links) + f"f{CHAIN}().real\n"
        ),
        "a chain of bases": (
            "class C0:\n    x = 1\n" + "".join(f"class C{i + 1}(C{i}): pass\n" for i in links) + f"C{CHAIN}().x\n"
        ),
        "a chain of attributes": "a" + ".a" * CHAIN + "\n",
        "a chain of method calls": "class A:\n    def a(self): return self\nA()" + ".a()" * CHAIN + "\n",
        "a chain of operators": "x = 1\n" + "x + " * CHAIN + "x\n",
        "brackets": "(" * CHAIN + "x" + ")" * CHAIN + "\n" + "[" * CHAIN + "\n",
        "scopes in scopes": "".join(" " * i + f"def f{i}(x):\n" for i in range(90)) + " " * 90 + "return x\n",
        "many bindings": (
            "x = 1\n" + "".join(f"if a{i}:\n    x = {'[x]' if i % 2 else '{x: x}'}\n" for i in few) + "x\n"
        ),
        "methods that call each other": (
            "class A:\n"
            + "".join(f"    def m{i}(self): return self.m{i * 7 % len(few)}()\n" for i in few)
            + "A().m1().m2\n"
        ),
        "nothing": "",
    }


def Harmful(folder: Path) -> Iterator[tuple[str, Path]]:
    """Makes the projects one by one; of each what it is, and its folder."""

    def Project(name: str, files: dict[str, str]) -> tuple[str, Path]:
        root = folder / name.replace(" ", "_")
        root.mkdir()
        for path, text in files.items():
            (root / path).write_text(text)
        return name, root

    for name, text in Chains().items():
        yield Project(name, {"a.py": text})
    itself = "import a\nfrom a import *\nfrom a import y as y\nx = a.a.a.x\ny()\n"
    yield Project("modules that import themselves", {"a.py": itself})
    ring = {"a.py": "from b import *\nfrom b import v as w\nw\n", "b.py": "from a import *\nfrom a import w as v\n"}
    yield Project("modules in a ring", ring)
    last = CHAIN // 10
    modules = {f"m{i}.py": f"from m{i + 1} import x\n" for i in range(last)}
    yield Project("a chain of modules", {**modules, f"m{last}.py": "x = 1\n", "a.py": "from m0 import x\nx\n"})

    name, root = Project("a ring of links", {"a.py": "import b\nb.x\n", "b.py": "x = 1\n"})
    (root / "deep").mkdir()
    (root / "deep/up").symlink_to(root, target_is_directory=True)
    (root / "self").symlink_to(root / "self")
    (root / "c.py").symlink_to(root / "d.py")
    (root / "d.py").symlink_to(root / "c.py")
    yield name, root
    name, root = Project("no text", {"a.py": "import b, c, d, e\nb.x\n"})
    (root / "b.py").write_bytes(bytes(range(256)) * 8)
    (root / "c.py").write_bytes("x = 1\nx".encode("utf-16"))
    (root / "d.py").mkdir()
    yield name, root
    name, root = Project("what may not be read", {"a.py": "import b\nb.x\n", "b.py": "x = 1\n"})
    (root / "b.py").chmod(0)
    yield name, root


class Asker:
    """Asks, times, and notes what raises."""

    def __init__(self, tally: Tally, workspace: Any, group: str, most: float) -> None:
        self._tally = tally
        self._workspace = workspace
        self._group = group
        self._most = most
        self.slowest = (0.0, "")

    def Ask(self, question: str, *given: Any) -> None:
        key = f"{question}({', '.join(map(repr, given))})"
        start = time.process_time()
        try:
            getattr(self._workspace, question)(*given)
        except Exception as error:  # anything that is raised is what this looks for
            self._tally.Add(self._group, key, False, "an answer", f"{type(error).__name__}: {error}")
        else:
            self._tally.Add(self._group, key, True)
        seconds = time.process_time() - start
        self.slowest = max(self.slowest, (seconds, key))
        if seconds > self._most:
            self._tally.Fault(f"questions above {self._most:g} s", key, f"{seconds:.2f} s")

    def AskFile(self, path: Path, places: list[tuple[int, int]], questions: tuple[str, ...]) -> None:
        for question in OF_A_FILE:
            self.Ask(question, str(path))
        for line, column in places:
            for question in questions:
                self.Ask(question, str(path), line, column)


def Places(text: str, pick: random.Random, count: int) -> list[tuple[int, int]]:
    """Random places (lines and columns from 1), some of them where nothing is; every place where `count` is 0."""
    lines = [line.encode() for line in Cut(text)]
    if not count:
        return [(line, column) for line, each in enumerate(lines, 1) for column in range(1, len(each) + 2)]
    found = [(0, 0), (1, 0), (1, 1), (len(lines), 10**6), (len(lines) + 5, 1), (10**9, 10**9)]
    for _ in range(count):
        line = pick.randrange(len(lines))
        found.append((line + 1, pick.randrange(len(lines[line]) + 2) + 1))
    return found


def LastPlaces(text: str) -> list[tuple[int, int]]:
    """Some places of the last lines."""
    lines = Cut(text)
    return [
        (line, column)
        for line in range(max(len(lines) - 2, 1), len(lines) + 1)
        for width in [len(lines[line - 1])]
        for column in sorted({1, 2, width // 2 + 1, width, width + 1})
    ]


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("robust", help="every question everywhere", description=__doc__)
    parser.add_argument("projects", type=Path, nargs="*", metavar="FOLDER", help=f"projects: {HOW_TO_GET}")
    parser.add_argument("--files", type=int, default=20, help="files of each project (20)")
    parser.add_argument("--places", type=int, default=100, help="places of each file; 0: every one (100)")
    parser.add_argument("--most", type=float, default=2.0, help="seconds of the processor that a question may take (2)")
    parser.add_argument("--only", help="the harmful projects whose name holds this")
    parser.add_argument("--seed", type=int, default=1)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    pick = random.Random(options.seed)
    tally = Tally("Questions everywhere", {"all": 100.0}, failures=options.failures)
    slowest: list[tuple[float, str]] = []
    with tempfile.TemporaryDirectory() as name:
        for what, root in Harmful(Path(name).resolve()):
            if options.only and options.only not in what:
                continue
            asker = Asker(tally, QuilletEngine([root]).workspace, what, options.most)
            for path in sorted(path for path in root.glob("*.py") if path.is_file())[:3]:
                text = ReadText(path)
                asker.AskFile(path, [*Places(text, pick, 5), *LastPlaces(text)], (*QUESTIONS, *WHOLE_PROJECT))
            asker.Ask("symbols", "x")
            slowest.append(asker.slowest)
    for project in options.projects:
        folder = project.resolve()
        asker = Asker(tally, QuilletEngine([folder]).workspace, folder.name, options.most)
        for path in pick.sample(SourceFiles(folder), options.files):
            asker.AskFile(path, Places(ReadText(path), pick, options.places), QUESTIONS)
        slowest.append(asker.slowest)
    print("the slowest question of each, in seconds of the processor:")
    for seconds, key in slowest:
        print(f"  {seconds:8.3f}  {key[-150:]}")
    return tally.Report()
