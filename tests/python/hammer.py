"""Calls whatever Python can reach of the extension with arguments that no caller means: `hammer.py SEED STEPS`.

Every callable and attribute of the modules and of their objects is taken, those of objects that were made by `__new__`
and never initialised as well. Arguments are odd values, objects of the extension, and objects whose conversion to a
number, a truth value or an item changes what other arguments are made of. Anything may be raised; nothing may crash. A
run is the same for the same seed, and a seed that crashes is told by `faulthandler`.
"""

from __future__ import annotations

import contextlib
import faulthandler
import gc
import io
import random
import sys
import types
from typing import Any

from quillet import _fastaccess, logicalline, optpgen, strutils, symbolinfo, tarvex
from quillet.tarvex import CPGenAnalyzerImpl, FinishedWithNode

MODULES = [tarvex, logicalline, optpgen, symbolinfo, _fastaccess, strutils]
# The host's own business, or what ends the run.
LEFT_OUT = {"_host", "_siblings", "analyze_files", "import_module", "annotations"}
STATEMENTS = [
    "x = y.z(a, *b, c=d)[e] + 1",
    "def f(a, *b, c: int = 3, **d) -> 'str':  # type: (int) -> str",
    "class A(B, c.D):",
    "for a, (b, c) in d:  # type: int",
    "import a.b as c, d",
    "match x:",
    "case {'k': [a, *b], **rest} if x:",
    "with open(a) as b, (c) as d:",
    "x = = 1",
    "lambda a, b=c: f'{d!r:{e}}'",
    "global a, b",
]


class Odd(int):
    """A number whose conversions do a step first."""

    step: Any = staticmethod(lambda: None)

    def _done(self, value: Any) -> Any:
        self.step()
        return value

    def __index__(self) -> int:
        return self._done(random.Random(int.__hash__(self)).randrange(-3, 9))

    def __bool__(self) -> bool:
        return self._done(True)

    def __eq__(self, other: object) -> bool:
        return self._done(other is self)

    def __hash__(self) -> int:
        return self._done(7)


class OddIterable:
    def __init__(self, hammer: Hammer) -> None:
        self.hammer = hammer

    def __iter__(self) -> Any:
        for _ in range(3):
            self.hammer.disturb()
            yield self.hammer.value()

    def __len__(self) -> int:
        return 3

    def __getitem__(self, index: int) -> Any:
        self.hammer.disturb()
        if index > 3:
            raise IndexError
        return self.hammer.value()


class Hammer:
    def __init__(self, seed: int) -> None:
        self.random = random.Random(seed)
        self.analyzer = CPGenAnalyzerImpl((3, 12))
        self.depth = 0
        self.lists: list[list[Any]] = [[], [1, "a", None]]
        self.lists[0].append(self.lists[0])
        self.buffers = [bytearray(b"abc (d) 'e'" * 9) for _ in range(3)]
        self.classes = [
            found
            for module in MODULES
            for name, found in sorted(vars(module).items())
            if isinstance(found, type) and name not in LEFT_OUT and found.__module__.startswith("quillet")
        ]
        # Each a class of the host's that may override anything.
        self.classes += [types.new_class(f"Sub{c.__name__}", (c,)) for c in self.classes if self.takes_subclass(c)]
        self.objects: list[Any] = [self.analyzer, self.analyzer._fLogicalParser, self.analyzer._fNodeWalker]
        self.objects += [self.analyzer._fTypeHintWalker, self.analyzer._fLogicalParser._fMatchCaseStatementParser]
        for cls in self.classes:
            self.add(lambda cls=cls: cls.__new__(cls))
        self.refill()

    @staticmethod
    def takes_subclass(cls: type) -> bool:
        with contextlib.suppress(TypeError):
            types.new_class("Probe", (cls,))
            return True
        return False

    def add(self, make: Any) -> None:
        with contextlib.suppress(Exception):
            self.objects.append(make())

    def refill(self) -> None:
        """Good objects, of which the run uses up some."""
        for text in self.random.sample(STATEMENTS, 4):
            for line in logicalline.GetLogicalsFromText(text, (3, 12)):
                self.objects.append(line)
                self.add(lambda line=line: self.analyzer.ParseToNode(line, True))
        sub = self.hooked_line_class()
        self.add(lambda: sub("unknown", ("x", "=", "y"), ((0, 0), (0, 2), (0, 4))))
        for cls in self.random.sample(self.classes, 8):
            self.add(lambda cls=cls: cls())
        if len(self.objects) > 400:
            del self.objects[100:250]

    def hooked_line_class(self) -> type:
        hammer = self

        class Hooked(logicalline.CLogicalLine):
            def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
                hammer.disturb()
                super().AppendTypeEquiv(name, equiv)

            def AppendArgTypeEquiv(self, name: bytes, info: bytes) -> None:
                super().AppendArgTypeEquiv(name, info)
                hammer.disturb()

            def ClearDerivedInfo(self) -> None:
                hammer.disturb()
                super().ClearDerivedInfo()

            def GetExpLogicals(self) -> Any:
                hammer.disturb()
                return super().GetExpLogicals()

        return Hooked

    # ---- values ----

    def value(self) -> Any:
        rand = self.random
        kind = rand.randrange(22)
        if kind < 8:
            return rand.choice(self.objects)
        if kind == 8:
            return rand.choice([0, 1, -1, 2, 5, 255, 256, 2**31 - 1, -(2**31), 2**63 - 1, -(2**63), 2**64, 10**400])
        if kind == 9:
            return rand.choice(["", "x", "a.b", "\udc80", "\ud800x", "\0", "'", "(" * 50, "é\U0001f600", "x" * 5000])
        if kind == 10:
            return rand.choice([b"", b"x", b"\xff\xfe", b"\0", b"int", b":s:", b"(['\"", b"y" * 3000])
        if kind == 11:
            return rand.choice(self.buffers)
        if kind == 12:
            return rand.choice(self.lists)
        if kind == 13:
            odd = Odd(rand.randrange(5))
            odd.step = self.disturb
            return odd
        if kind == 14:
            return OddIterable(self)
        if kind == 15:
            return rand.choice([None, True, False, 1.5, float("nan"), object(), Ellipsis, {}, {"a": 1}, set(), ()])
        if kind == 16:
            return tuple(self.value() for _ in range(rand.randrange(4)))
        if kind == 17:
            return [self.value() for _ in range(rand.randrange(4))]
        if kind == 18:
            return {rand.choice(["x", "kwlist", 1, b"a"]): self.value()}
        if kind == 19:
            return rand.choice([(3, 12), (2, 7), (3,), (), (10**30, 1), ("3", 8)])
        if kind == 20:
            return rand.choice(self.classes)
        return rand.choice([("x", "=", "y"), ("if", None, ":"), ("case", "[", "a", "]", ":"), ((0, 0), (0, 1), (1, 0))])

    # ---- steps ----

    def disturb(self) -> None:
        """What a host may do in the middle of anything."""
        if self.depth >= 3:
            return
        kind = self.random.randrange(9)
        if kind == 0:
            self.random.choice(self.lists).clear()
        elif kind == 1:
            with contextlib.suppress(BufferError):
                self.random.choice(self.buffers).clear()
        elif kind == 2:
            gc.collect(0)
        elif kind == 3:
            del self.objects[self.random.randrange(5, len(self.objects))]
        elif kind == 4:
            nodes = [found for found in self.objects if isinstance(found, tarvex.CNode)]
            if nodes:
                with contextlib.suppress(Exception):
                    FinishedWithNode(self.random.choice(nodes))
        elif kind == 5:
            for _ in range(70):
                with contextlib.suppress(Exception):
                    self.analyzer.ParseTokenListToNode(["a", "=", "b"], False)
        elif kind == 6:
            self.random.choice(self.buffers).extend(b"more ('x')" * 20)
        else:
            self.step()

    def step(self) -> None:
        self.depth += 1
        try:
            owner = self.random.choice(MODULES) if self.random.random() < 0.4 else self.random.choice(self.objects)
            names = [name for name in dir(owner) if name not in LEFT_OUT and self.is_ours(owner, name)]
            if not names:
                return
            name = self.random.choice(names)
            if not isinstance(owner, types.ModuleType) and self.random.random() < 0.15:
                setattr(owner, name, self.value())
                return
            found = getattr(owner, name)
            if not callable(found):
                self.keep(found)
                return
            makes_tables = found in (CPGenAnalyzerImpl, tarvex.CPGenParserImpl, tarvex.CTypeHintWalker)
            if makes_tables and self.random.random() > 0.02:
                return  # they take long
            self.keep(found(*[self.value() for _ in range(self.random.choice([0, 1, 1, 2, 2, 3, 4, 5, 7]))]))
        except Exception:
            pass
        finally:
            self.depth -= 1

    @staticmethod
    def is_ours(owner: Any, name: str) -> bool:
        if isinstance(owner, types.ModuleType):
            return not name.startswith("__") or name == "__FinishedWithNode"
        # Of the host's own operations those that the extension answers.
        return not name.startswith("__") or name in ("__repr__", "__eq__", "__init__", "__hash__")

    def keep(self, result: Any) -> None:
        if isinstance(result, list):
            self.lists[self.random.randrange(len(self.lists))] = result
        if result is not None and not isinstance(result, (int, str, bytes)):
            self.objects.append(result)

    def run(self, steps: int) -> None:
        for i in range(steps):
            self.step()
            if i % 50 == 0:
                self.refill()


def main() -> None:
    faulthandler.enable()
    faulthandler.dump_traceback_later(300, exit=True)
    sys.unraisablehook = lambda _: None
    # What the core prints and reports is of no interest here.
    with contextlib.redirect_stdout(io.StringIO()), contextlib.redirect_stderr(io.StringIO()):
        Hammer(int(sys.argv[1])).run(int(sys.argv[2]))
    print("held")


if __name__ == "__main__":
    main()
