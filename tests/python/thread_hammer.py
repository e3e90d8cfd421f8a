"""Many threads at once on what threads may share: `thread_hammer.py SEED STEPS [THREADS]`.

Each thread takes STEPS steps on batches, their results, an index, a workspace and analyzers that all of them hold: it
reads, begins, closes and drops, edits buffers, stops questions and lets them go on, and calls an analyzer that another
thread is in. What it gets is right or a clear exception; at the end everything answers as it would have alone. For
builds with sanitizers, and for builds of Python without its lock.
"""

from __future__ import annotations

import faulthandler
import random
import sys
import tempfile
import threading
from collections.abc import Callable
from pathlib import Path
from typing import Any

import quillet
from quillet import Workspace, analyze_files, bind
from quillet._workspace import Stopped
from quillet.index.questions import Index, Query
from quillet.index.update import Reports, Settings, update

FILES = 40
SOURCE = """\
import other{number}

class Shop{number}:
    limit: int = {number}

    def total(self, items=None, *, rate=1.5):
        for item in items or []:
            self.limit += item.price * rate  # type: int
        return other{number}.check(self.limit)


def make{number}(name):
    return Shop{number}().total(name, rate=2)
"""
# What a call may say where another thread is in the middle of something.
EXPECTED = (Stopped, ValueError, RuntimeError, StopIteration, OSError)


class Hammer:
    """What the threads share."""

    def __init__(self, folder: Path) -> None:
        self.paths = [folder / f"shop{number}.py" for number in range(FILES)]
        for number, path in enumerate(self.paths):
            path.write_text(SOURCE.format(number=number))
        self.sources = [(str(path), path.read_bytes()) for path in self.paths]
        self.index_path = str(folder / ".quillet-index")
        nothing = Reports(*[lambda *_: None] * 5)
        update(self.index_path, Settings((str(folder),)), nothing)
        self.expected = [list(result.records) for result in analyze_files(self.sources)]
        self.workspace = Workspace(folder)
        self.batch = analyze_files(self.sources, bindings=True)
        self.results: list[Any] = []
        self.index = Index(self.index_path)
        self.failures: list[BaseException] = []

    def threads(self, seed: int, steps: int, count: int) -> None:
        threads = [threading.Thread(target=self.run, args=(seed * 1000 + number, steps)) for number in range(count)]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join()

    def run(self, seed: int, steps: int) -> None:
        rand = random.Random(seed)
        kinds: list[Callable[[random.Random], None]] = [
            self.read_batch,
            self.read_result,
            self.analyze_alone,
            self.ask_index,
            self.ask_workspace,
            self.edit_workspace,
            self.stop_workspace,
        ]
        for _ in range(steps):
            try:
                rand.choice(kinds)(rand)
            except EXPECTED:
                pass
            except BaseException as error:  # told by the main thread
                self.failures.append(error)
                return

    def read_batch(self, rand: random.Random) -> None:
        batch = self.batch
        result = next(batch, None)
        if result is None:
            self.batch = analyze_files(self.sources, jobs=rand.choice([1, 2, 3]), bindings=True)
            return
        self.results.append(result)
        if rand.random() < 0.05:
            batch.close()
        if len(self.results) > 60:
            del self.results[: rand.randrange(30)]

    def read_result(self, rand: random.Random) -> None:
        result = rand.choice(self.results) if self.results else None
        if result is None:
            return
        number = next(place for place, (path, _) in enumerate(self.sources) if path == result.path)
        records = result.records
        begin = rand.randrange(len(records))
        assert list(records[begin:]) == self.expected[number][begin:], result
        occurrences = result.bindings.occurrences
        assert len(list(occurrences)) == len(occurrences)

    def analyze_alone(self, rand: random.Random) -> None:
        path, source = rand.choice(self.sources)
        assert len(quillet.analyze(source.decode()).lines) > 10, path
        assert len(bind(source).occurrences) > 10, path

    def ask_index(self, rand: random.Random) -> None:
        number = rand.randrange(FILES)
        index = self.index if rand.random() < 0.7 else Index(self.index_path)
        hits = list(index.find(Query(f"make{number}", "exact")))
        assert {hit.path for hit in hits} == {f"shop{number}.py".encode()}, hits

    def ask_workspace(self, rand: random.Random) -> None:
        path = rand.choice(self.paths)
        line, column = rand.randrange(1, 14), rand.randrange(1, 30)
        workspace = self.workspace
        ask = rand.choice(
            [
                lambda: workspace.definitions(path, line, column),
                lambda: workspace.references(path, line, column),
                lambda: workspace.complete(path, line, column),
                lambda: workspace.hover(path, line, column),
                lambda: workspace.outline(path),
                lambda: workspace.problems(path),
                lambda: workspace.symbols("Shop"),
                lambda: workspace.named(f"{path.stem}.make1"),
                lambda: workspace.source(path),
            ]
        )
        ask()

    def edit_workspace(self, rand: random.Random) -> None:
        path = rand.choice(self.paths)
        kind = rand.randrange(4)
        if kind == 0:
            self.workspace.open(path, SOURCE.format(number=rand.randrange(FILES)))
        elif kind == 1:
            self.workspace.change(path, [("", 1, 1, 1, "x = 1\n")])
        elif kind == 2:
            self.workspace.close(path)
        else:
            self.workspace.refresh()

    def stop_workspace(self, rand: random.Random) -> None:
        if rand.random() < 0.2:
            self.workspace.stop()
            self.workspace.proceed()

    def check(self) -> None:
        """Whether everything answers as if nothing had happened."""
        for failure in self.failures:
            raise failure
        self.workspace.proceed()
        for path in self.paths:
            self.workspace.close(path)
        for number, path in enumerate(self.paths):
            [found] = self.workspace.definitions(path, 13, 12)
            assert (Path(found.path).name, found.line) == (path.name, 3), found
            assert list(self.index.find(Query(f"Shop{number}", "exact", ("def",))))
        assert [list(result.records) for result in analyze_files(self.sources)] == self.expected


def main() -> None:
    faulthandler.enable()
    seed, steps = int(sys.argv[1]), int(sys.argv[2])
    with tempfile.TemporaryDirectory() as folder:
        hammer = Hammer(Path(folder))
        hammer.threads(seed, steps, int(sys.argv[3]) if len(sys.argv) > 3 else 8)
        hammer.check()
    print("held")


if __name__ == "__main__":
    main()
