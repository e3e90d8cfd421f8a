"""What agreed and what did not: counted by group, each failure with what was expected and what was given."""

from __future__ import annotations

import argparse
from collections import Counter
from collections.abc import Iterable, Mapping


class Tally:
    """Counts cases. `targets` has the percentage that a group should reach, or None; the group
    "all" is that of all cases.
    """

    def __init__(
        self, title: str, targets: Mapping[str, float | None] | None = None, *, failures: bool = False
    ) -> None:
        self._title = title
        self._targets = dict(targets or {})
        self._failures = failures
        self._right: Counter[str] = Counter()
        self._all: Counter[str] = Counter()
        self._notes: Counter[str] = Counter()
        self._bounds: dict[str, int] = {}

    def Add(self, group: str, key: str, right: bool, expected: object = "", given: object = "") -> None:
        """One case; where it is not right and failures are wanted, it is printed at once."""
        self._all[group] += 1
        self._right[group] += right
        if not right and self._failures:
            print(f"{group}: {key}\n  expected  {Shown(expected)}\n  given     {Shown(given)}", flush=True)

    def Note(self, what: str, count: int = 1, *, most: int | None = None) -> None:
        """Something counted beside the cases, which has to stay within `most` where that is said."""
        self._notes[what] += count
        if most is not None:
            self._bounds[what] = most

    def Fault(self, what: str, key: str, detail: object = "", *, most: int | None = 0) -> None:
        """Something that should not be: noted, bounded (None: not so), and printed among the failures."""
        self.Note(what, most=most)
        if self._failures:
            print(f"{what}: {key}\n  given     {Shown(detail)}", flush=True)

    def Report(self) -> int:
        """Prints the table. 0 where each target is met and nothing is above its bound, 1 otherwise."""
        print(f"\n{self._title}\n")
        print("| group | cases | right | share | target |\n| --- | ---: | ---: | ---: | ---: |")
        failed = False
        if "all" in self._targets and self._all:
            self._right["all"], self._all["all"] = sum(self._right.values()), sum(self._all.values())
        for group, count in self._all.items():
            share = 100 * self._right[group] / count
            target = self._targets.get(group)
            failed |= target is not None and share < target
            shown = "" if target is None else f"{target:g} %"
            print(f"| {group} | {count:,} | {self._right[group]:,} | {share:.1f} % | {shown} |")
        for what, count in self._notes.items():
            bound = self._bounds.get(what)
            failed |= bound is not None and count > bound
            print(f"| {what} | {count:,} | | | {'' if bound is None else f'at most {bound}'} |")
        missing = [group for group in self._targets if not self._all[group]]
        for group in missing:
            print(f"| {group} | 0 | | | nothing was measured |")
        return 1 if failed or missing else 0


def Shown(value: object) -> str:
    """A value in one line: members of a set in order."""
    if isinstance(value, str):
        return value or "nothing"
    if isinstance(value, Iterable):
        return ", ".join(sorted(map(str, value))) or "nothing"
    return str(value)


def AddFailures(parser: argparse.ArgumentParser) -> None:
    parser.add_argument("--failures", action="store_true", help="print each case that is not right")
