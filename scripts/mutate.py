#!/usr/bin/env python3
"""Changes the core in small ways, one at a time, and tells which changes the tests notice.

    scripts/mutate.py                      150 changes, spread over all folders of the core
    scripts/mutate.py --sample 40 --seed 7 --folder walker --folder hints
    scripts/mutate.py --list               the changes that would be tried
    scripts/mutate.py --at-once 2          by as many copies of the tree, each with builds of its own
    scripts/mutate.py --show               what is known by now

A change is a comparison with its bound moved or turned round, "and" for "or", a condition that is always or
never true, a constant or an index off by one, the branches of a "?:" exchanged, "break" for "continue", or a
statement left out. Each is made in a copy of the tree (`--work`, below build/ by itself), which is built with
little optimisation, as the tests take longer than the compiler; then the tests run, those of the changed folder first
and then the one that compares digests, and the first that fails ends the trial. Tests that take long run last, and
only where the digest sees a difference:

    noticed     a test of the core failed, crashed or ran out of time
    python      only a test of the package noticed (with --python, which builds the extension and asks those tests
                that are about the changed folder)
    equivalent  no test noticed, and `quillet_digest` says of the corpus, and of the corpus spoilt, what it said before
    SURVIVED    no test noticed, and the digest differs: a test is missing
    invalid     it does not compile

What became of a change is kept in the work folder, by the text of its file, so that a run that was stopped goes on
where it was, and one behind a new test tries what no test noticed again with --again. Exit code 1 where less than 95 %
of the changes that change anything were noticed.
"""

from __future__ import annotations

import argparse
import hashlib
import json
import os
import random
import re
import resource
import shutil
import signal
import subprocess
import sys
import sysconfig
import threading
import time
from collections import Counter
from collections.abc import Iterator, Sequence
from concurrent.futures import ThreadPoolExecutor
from dataclasses import asdict, dataclass
from pathlib import Path

ROOT = Path(__file__).resolve().parent.parent
COPIED = ("core", "tests", "bench", "cmake", "resources", "fuzz", "bindings", "python", "docs", "examples", "scripts")
FOLDERS = re.findall(r"quillet_library\((\w+)", (ROOT / "core" / "CMakeLists.txt").read_text())
WANTED = 0.95
# Tests that take more seconds than this are asked only about changes that the digest sees.
SLOW = 8.0
# The test that looks at all folders.
DIGESTS = "digests"
NICENESS = int(os.environ.get("MUTATE_NICENESS", "10"))

# Folder, name, and the last folder that the test is linked with, which reaches all those before it.
TESTS = [
    (folder, name, max(library.split(), key=FOLDERS.index))
    for folder, name, library in re.findall(
        r"quillet_core_test\((\w+)/(\w+) ([\w ]+)\)", (ROOT / "tests" / "core" / "CMakeLists.txt").read_text()
    )
]


# Which of the package's tests are about a folder: beginnings of their files' names.
READING = "golden complete_reading block_rules type_comments soft_keywords tarvex unchanged_records agreement_with_ast"
LOOKING = "workspace types_at_run_time server_protocol server_every_request truth_runners"
PACKAGE_TESTS = {
    "analysis": f"{READING} batch process host",
    "names": "names block_rules golden",
    "syntax": "syntax_agreement names workspace",
    "output": "cli export find golden process",
    "index": "index find",
    "site": "report",
    "corpus": "corpus.py corpus_command corpus_tar",
    "project": "index find gitignore cli.py workspace",
    "program": LOOKING,
    "inference": LOOKING,
    "workspace": LOOKING,
}


@dataclass(frozen=True)
class Change:
    """A place in a file, what stands there and what takes its place."""

    file: str
    offset: int
    old: str
    new: str
    kind: str

    def key(self, text: str) -> str:
        around = f"{self.file}:{self.kind}:{self.old}->{self.new}:{text[max(self.offset - 80, 0) : self.offset + 80]}"
        return hashlib.sha1(around.encode()).hexdigest()[:16]

    def shown(self, text: str) -> str:
        line = text.count("\n", 0, self.offset) + 1
        begin = text.rfind("\n", 0, self.offset) + 1
        end = text.find("\n", self.offset)
        return f"{self.file}:{line}: {self.kind}: {self.old!r} -> {self.new!r}   | {text[begin:end].strip()}"


# ---- which changes there are ----


def blanked(text: str) -> str:
    """The text with comments, strings and preprocessor lines blanked, so that offsets stay."""
    pattern = re.compile(
        r"""//[^\n]*|/\*.*?\*/|R"\((?:.|\n)*?\)"|"(?:\\.|[^"\\\n])*"|'(?:\\.|[^'\\\n])+'|^[ \t]*\#(?:\\\n|[^\n])*""",
        re.DOTALL | re.MULTILINE,
    )
    return pattern.sub(lambda match: re.sub(r"[^\n]", " ", match[0]), text)


REPLACED = [
    ("bound", r" <= ", " < "),
    ("bound", r" < ", " <= "),
    ("bound", r" >= ", " > "),
    ("bound", r" > ", " >= "),
    ("comparison", r" == ", " != "),
    ("comparison", r" != ", " == "),
    ("logic", r" && ", " || "),
    ("logic", r" \|\| ", " && "),
    ("off by one", r" \+ 1\b(?!\.)", ""),
    ("off by one", r" - 1\b(?!\.)", ""),
    ("off by one", r" \+ 2\b", " + 1"),
    ("arithmetic", r" \+ (?=[a-z(])", " - "),
    ("arithmetic", r" - (?=[a-z(])", " + "),
    ("arithmetic", r" \+= ", " -= "),
    ("truth", r"\btrue\b", "false"),
    ("truth", r"\bfalse\b", "true"),
    ("minimum", r"\bstd::min\b", "std::max"),
    ("minimum", r"\bstd::max\b", "std::min"),
    ("jump", r"\bbreak;", "continue;"),
    ("jump", r"\bcontinue;", "break;"),
    ("negation", r"(?<=[ (])!(?=[a-z(])", ""),
    ("step", r"\+\+(?=[a-z])", "--"),
    ("case", r"^ *case [^:\n]*(?:::[^:\n]*)*:\n(?= *case )", ""),
]
CONSTANT = re.compile(r"\bconstexpr [\w:<> ]+ k\w+ = (?:size_t\{)?(\d+)")
CONDITION = re.compile(r"\b(?:if|while) \(")
TERNARY = re.compile(r" \? ")
STATEMENT = re.compile(
    r"(?:(?<=[;{}])|(?<=\) )|(?<=else ))\s*((?:[\w:.\->]+(?:\[\w+\])?(?: [+\-|&]?= |\()|\+\+\w|--\w)[^;{}]*;)"
)


def closing_bracket(text: str, opening: int) -> int:
    """The bracket that closes the one at `opening`, or -1."""
    depth = 0
    for at in range(opening, len(text)):
        depth += text[at] in "([{"
        depth -= text[at] in ")]}"
        if depth == 0:
            return at
    return -1


def branches(text: str, question: int) -> tuple[int, int, int] | None:
    """Where the ":" of a "?" stands, and where its second branch ends, if both are plain."""
    depth, colon = 0, -1
    for at in range(question + 3, min(len(text), question + 400)):
        char = text[at]
        if char in "([{":
            depth += 1
        elif char in ")]}":
            depth -= 1
        if colon < 0 and depth == 0 and text.startswith(" : ", at):
            colon = at
        elif depth < 0 or (depth == 0 and char in ";,?" and at > question + 2):
            return (question, colon, at) if colon > 0 and char != "?" else None
    return None


def changes_of(name: str, text: str) -> Iterator[Change]:
    """All changes of a file."""
    masked = blanked(text)
    for kind, pattern, new in REPLACED:
        for match in re.finditer(pattern, masked, re.MULTILINE):
            line = masked[masked.rfind("\n", 0, match.start()) + 1 : match.start()]
            if match[0].strip() in ("<", ">") and ("template" in line or "operator" in line):
                continue
            if kind == "truth" and "_v<" in line:
                continue
            if kind == "jump" and match[0].startswith("break") and in_switch(masked, match.start()):
                continue
            yield Change(name, match.start(), text[match.start() : match.end()], new, kind)
    for match in CONSTANT.finditer(masked):
        number = int(match[1])
        for new_number in (number + 1, max(number - 1, 0)):
            if new_number != number:
                yield Change(name, match.start(1), match[1], str(new_number), "constant")
    for match in CONDITION.finditer(masked):
        opening = match.end() - 1
        closing = closing_bracket(masked, opening)
        condition = text[opening + 1 : closing]
        # A declaration in front is needed for what follows, and a loop for ever ends nothing.
        declares = ";" in condition or re.match(r"(?:const )?[\w:<>*&, ]+ [*&]?\[?\w+[\], \w]* = ", condition)
        if closing < 0 or declares:
            continue
        if match[0].startswith("if"):
            yield Change(name, opening + 1, condition, f"true || ({condition})", "always")
        yield Change(name, opening + 1, condition, f"false && ({condition})", "never")
    for match in TERNARY.finditer(masked):
        if places := branches(masked, match.start()):
            question, colon, end = places
            first, second = text[question + 3 : colon], text[colon + 3 : end]
            yield Change(name, question + 3, text[question + 3 : end], f"{second} : {first}", "branches")
    for match in STATEMENT.finditer(masked):
        statement = match[1]
        if re.match(
            r"(?:return|throw|using|delete|co_|static_assert|goto|case|default|public|private|extern)\b", statement
        ):
            continue
        if re.match(r"[\w:]+\([\w:& ,*]*\) const;", statement) or "operator" in statement:
            continue
        if name.endswith(".h") and re.match(r"[\w:]+\([^)]*\b(?:const|int|size_t|Text|CNode)\b", statement):
            continue
        yield Change(name, match.start(1), text[match.start(1) : match.end(1)], ";", "statement")


def in_switch(masked: str, at: int) -> bool:
    """Whether the innermost brace around is that of a switch, near enough."""
    depth = 0
    for i in range(at, 0, -1):
        depth += masked[i] == "}"
        depth -= masked[i] == "{"
        if depth < 0:
            return "switch (" in masked[masked.rfind("\n", 0, i) + 1 : i] or bool(
                re.search(r"(case [^\n]*|default): *$", masked[masked.rfind("\n", 0, i) + 1 : i])
            )
    return False


def all_changes(folders: list[str]) -> dict[str, list[Change]]:
    """The changes of each folder."""
    changes: dict[str, list[Change]] = {}
    for folder in folders:
        found = changes.setdefault(folder, [])
        for path in sorted((ROOT / "core" / folder).glob("*.*")):
            if path.suffix in (".cc", ".h"):
                found.extend(changes_of(str(path.relative_to(ROOT)), path.read_text()))
    return changes


def sample_of(changes: dict[str, list[Change]], count: int, seed: int) -> list[Change]:
    """A part of every folder, in proportion to the square root of what there is, in an order that mixes them."""
    weights = {folder: len(found) ** 0.5 for folder, found in changes.items() if found}
    total = sum(weights.values())
    sample: list[Change] = []
    for folder, weight in weights.items():
        wanted = max(1, round(count * weight / total))
        sample += random.Random(f"{seed}:{folder}").sample(changes[folder], min(wanted, len(changes[folder])))
    random.Random(seed).shuffle(sample)
    return sample[:count]


# ---- trying one ----


class Workshop:
    """A copy of the tree, its builds, and what they say without a change."""

    def __init__(self, folder: Path, *, folders: list[str], jobs: int, python: bool) -> None:
        self.folder = folder
        self.tree = folder / "tree"
        self.build = folder / "core"
        self.extension = folder / "extension"
        self.tests = [test for test in TESTS if test[0] in folders or test[1] == DIGESTS]
        self.jobs = jobs
        self.python = python
        self.times: dict[str, float] = {}
        self.digest = ""

    def prepare(self) -> None:
        """Copies what differs, builds it, and asks the digest and the tests unless the same tree was asked before."""
        self.tree.mkdir(parents=True, exist_ok=True)
        for name in COPIED:
            mirror(ROOT / name, self.tree / name)
        for path in ROOT.glob("*"):
            if path.is_file():
                copy_if_other(path, self.tree / path.name)
        linker = next(
            (name for name in ("mold", "lld", "gold") if shutil.which(f"ld.{name}") or shutil.which(name)), ""
        )
        flags = [f"-DCMAKE_EXE_LINKER_FLAGS=-fuse-ld={linker}"] if linker else []
        base: list[str | Path] = [
            "cmake",
            "-S",
            self.tree,
            "-G",
            "Ninja",
            "-DCMAKE_BUILD_TYPE=Debug",
            "-DCMAKE_CXX_FLAGS_DEBUG=-O1 -w",
            *flags,
        ]
        require([*base, "-B", self.build, "-DQUILLET_TESTS=ON", "-DQUILLET_EXTENSION=OFF"])
        say("building the tree as it is")
        require(self.ninja(self.build, [f"{name}_test" for _, name, _ in self.tests] + ["quillet_digest"]))
        self.corpus = self.make_corpus()
        state = self.folder.parent / "as_it_is.json"
        known = json.loads(state.read_text()) if state.exists() else {}
        fingerprint = f"{fingerprint_of(self.tree)} {self.tests}"
        if known.get("of") != fingerprint:
            known = {"of": fingerprint, "times": self.time_tests(), "digest": self.ask_digest()}
            state.write_text(json.dumps(known))
        self.times, self.digest = known["times"], known["digest"]
        if self.ask_digest() != self.digest:
            sys.exit("mutate: the digest is another in each run, so that it says nothing about a change")
        if self.python:
            require([*base, "-B", self.extension, f"-DPython_EXECUTABLE={sys.executable}", "-DQUILLET_TESTS=OFF"])
            require(self.ninja(self.extension, []))
            for tests in dict.fromkeys([READING, *PACKAGE_TESTS.values()]):
                say(f"running the package's tests of {tests} as it is")
                if failure := self.run_python(tests):
                    sys.exit(f"mutate: the package's tests fail without any change: {failure}")

    def time_tests(self) -> dict[str, float]:
        times = {}
        for _, name, _ in self.tests:
            say(f"running {name}_test as it is")
            begin = processor_time()
            if self.run_test(name, timeout=1800) != "":
                sys.exit(f"mutate: {name}_test fails without any change")
            times[name] = processor_time() - begin
        return times

    def ninja(self, build: Path, targets: list[str]) -> list[str | Path]:
        return ["ninja", "-C", build, f"-j{self.jobs}", *targets]

    def make_corpus(self) -> list[Path]:
        library = Path(sysconfig.get_path("stdlib"))
        files = sorted(path for path in library.glob("*.py") if path.stat().st_size < 30_000)
        files += sorted(path for path in (library / "test").glob("test_[fgpst]*.py") if path.stat().st_size < 12_000)
        chosen = random.Random(1).sample(files, min(len(files), 60))
        shipped = [self.tree / name for name in ("fuzz/corpus", "tests/golden", "tests/programs", "examples")]
        return [*shipped, *sorted(chosen)]

    def ask_digest(self) -> str:
        result = run([self.build / "tests/core/quillet_digest", *self.corpus], timeout=3600)
        return result.stdout if result.returncode == 0 else f"exit code {result.returncode}"

    def run_test(self, name: str, timeout: float) -> str:
        """Empty, or how the test failed. The limit counts seconds of the processor, which other work does not take."""
        test = [str(self.build / f"tests/core/{name}_test"), "--gtest_fail_fast", "--gtest_brief=1"]
        limits = ["sh", "-c", f'ulimit -t {int(timeout)}; exec "$@"', "sh"]
        try:
            result = run([*limits, *test], timeout=30 * timeout)
        except subprocess.TimeoutExpired:
            return f"{name}: out of time"
        if -result.returncode in (signal.SIGXCPU, signal.SIGKILL):
            return f"{name}: out of time"
        if result.returncode == 0:
            return ""
        failed = re.search(r"\[  FAILED  \] ([\w./]+)", result.stdout)
        return f"{name}: {failed[1] if failed else f'exit code {result.returncode}'}"

    def run_python(self, names: str) -> str:
        """Empty, or which of the package's tests fails whose names begin so."""
        environment = {**os.environ, "PYTHONPATH": f"{self.extension / 'python'}{os.pathsep}{self.tree}"}
        beginnings = tuple(names.split())
        tests = [
            path for path in (self.tree / "tests/python").glob("test_*.py") if path.name[5:].startswith(beginnings)
        ]
        command = [sys.executable, "-m", "pytest", "-q", "-x", "-p", "no:cacheprovider", *map(str, sorted(tests))]
        try:
            result = run(command, timeout=1200, cwd=self.tree, env=environment)
        except subprocess.TimeoutExpired:
            return "python: out of time"
        if result.returncode == 0:
            return ""
        failed = re.search(r"^(?:FAILED|ERROR) (\S+)", result.stdout, re.MULTILINE)
        return f"python: {failed[1] if failed else f'exit code {result.returncode}'}"

    def try_change(self, change: Change) -> tuple[str, str]:
        path = self.tree / change.file
        text = path.read_text()
        assert text[change.offset : change.offset + len(change.old)] == change.old
        path.write_text(text[: change.offset] + change.new + text[change.offset + len(change.old) :])
        try:
            return self.judge(change)
        finally:
            path.write_text(text)

    def judge(self, change: Change) -> tuple[str, str]:
        folder = change.file.split("/")[1]
        place = FOLDERS.index(folder)
        own = [name for test_folder, name, _ in self.tests if test_folder == folder]
        others = [name for _, name, last in self.tests if name not in own and FOLDERS.index(last) >= place]
        others.sort(key=lambda name: (name != DIGESTS, self.times[name]))
        ordered = sorted(own, key=self.times.__getitem__) + others
        slow = [name for name in ordered if self.times[name] > SLOW and name != DIGESTS]
        if outcome := self.ask_tests([name for name in ordered if name not in slow]):
            return outcome
        if not self.builds(["quillet_digest"]):
            return "invalid", ""
        try:
            digest = self.ask_digest()
        except subprocess.TimeoutExpired:
            digest = "out of time"
        if digest != self.digest and (outcome := self.ask_tests(slow)):
            return outcome
        if self.python:
            run(self.ninja(self.extension, []), timeout=3600)
            if failure := self.run_python(PACKAGE_TESTS.get(folder, READING)):
                return "python", failure
        if digest == self.digest:
            return "equivalent", ""
        return "SURVIVED", difference(self.digest, digest)

    def ask_tests(self, names: list[str]) -> tuple[str, str] | None:
        """What became of the change, if one of the tests says so."""
        for name in names:
            if not self.builds([f"{name}_test"]):
                return "invalid", ""
            failure = self.run_test(name, timeout=20 + 6 * self.times[name])
            if failure:
                return "noticed", failure
        return None

    def builds(self, targets: list[str]) -> bool:
        return run(self.ninja(self.build, targets), timeout=3600).returncode == 0


def processor_time() -> float:
    """That of the processes that have ended."""
    usage = resource.getrusage(resource.RUSAGE_CHILDREN)
    return usage.ru_utime + usage.ru_stime


def difference(before: str, after: str) -> str:
    """Which numbers of a digest are others."""
    pairs = zip(before.split(), after.split(), strict=False)
    words = before.split()
    changed = [words[i - 1] for i, (old, new) in enumerate(pairs) if old != new and i > 0]
    return "other " + ", ".join(changed) if changed else after.strip()


def run(command: Sequence[str | Path], timeout: float, **options: object) -> subprocess.CompletedProcess[str]:
    """Runs a command behind everybody else, and keeps what it prints."""
    return subprocess.run(  # type: ignore[call-overload, no-any-return]
        ["nice", "-n", str(NICENESS), *map(str, command)],
        stdout=subprocess.PIPE,
        stderr=subprocess.STDOUT,
        text=True,
        errors="replace",
        timeout=timeout,
        **options,
    )


def require(command: Sequence[str | Path]) -> None:
    """Runs a command that has to succeed."""
    result = run(command, timeout=7200)
    if result.returncode != 0:
        sys.exit(f"mutate: {' '.join(map(str, command))}\n{result.stdout[-4000:]}")


def copy_if_other(source: Path, target: Path) -> None:
    """Copies a file unless it is there as it is."""
    if not target.exists() or target.read_bytes() != source.read_bytes():
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copyfile(source, target)


def mirror(source: Path, target: Path) -> None:
    """Copies what differs, so that what does not is not built again; removes what is gone."""
    wanted = set()
    for path in source.rglob("*"):
        if path.is_file() and "__pycache__" not in path.parts:
            wanted.add(path.relative_to(source))
            copy_if_other(path, target / path.relative_to(source))
    for path in list(target.rglob("*")):
        if path.is_file() and path.relative_to(target) not in wanted:
            path.unlink()


def fingerprint_of(tree: Path) -> str:
    """A number for all that is built and asked about."""
    sha = hashlib.sha1()
    names = ("core", "tests/core", "tests/programs", "tests/golden", "fuzz/corpus", "examples", "resources")
    for path in sorted(path for name in names for path in (tree / name).rglob("*")):
        if path.is_file():
            sha.update(str(path.relative_to(tree)).encode() + path.read_bytes())
    return sha.hexdigest()


def say(message: str) -> None:
    """Tells whoever waits."""
    print(f"mutate: {message}", file=sys.stderr, flush=True)


# ---- all of them ----


def summary_of(results: list[dict[str, str]]) -> tuple[str, bool]:
    """The counts, and whether enough was noticed."""
    counts = Counter(result["outcome"] for result in results)
    noticed = counts["noticed"] + counts["python"]
    changing = noticed + counts["SURVIVED"]
    share = noticed / changing if changing else 1.0
    text = ", ".join(f"{count} {outcome}" for outcome, count in sorted(counts.items()))
    return f"{len(results)} changes: {text}; {share:.1%} of those that change anything are noticed", share >= WANTED


def main() -> int:
    """Tries a sample, or says what would be tried."""
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--sample", type=int, default=150)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument(
        "--folder", action="append", choices=FOLDERS, help="only of this one, by its own tests (may be repeated)"
    )
    parser.add_argument("--work", type=Path, default=ROOT / "build" / "mutate")
    parser.add_argument("--jobs", type=int, default=2, help="compilers at once, in each copy")
    parser.add_argument("--at-once", type=int, default=1, help="copies of the tree, with a change each")
    parser.add_argument("--python", action="store_true", help="ask the package's tests, too")
    parser.add_argument("--again", action="store_true", help="try again what no test noticed")
    parser.add_argument("--list", action="store_true")
    parser.add_argument("--show", action="store_true")
    options = parser.parse_args()

    changes = all_changes(options.folder or FOLDERS)
    sample = sample_of(changes, options.sample, options.seed)
    texts = {change.file: (ROOT / change.file).read_text() for change in sample}
    if options.list:
        for change in sample:
            print(change.shown(texts[change.file]))
        print(f"{len(sample)} of {sum(map(len, changes.values()))} changes", file=sys.stderr)
        return 0

    options.work.mkdir(parents=True, exist_ok=True)
    log = options.work / "results.jsonl"
    known: dict[str, dict[str, str]] = {}
    if log.exists():
        for line in log.read_text().splitlines():
            entry = json.loads(line)
            known[entry["key"]] = entry
    keys = {change: change.key(texts[change.file]) for change in sample}
    todo = [
        change
        for change in sample
        if keys[change] not in known or (options.again and known[keys[change]]["outcome"] in ("SURVIVED", "equivalent"))
    ]
    # Headers last: with them much is built again.
    todo.sort(key=lambda change: change.file.endswith(".h"))
    if options.show:
        todo = []
    # At once, and not behind the trials under way: the next run puts their files right.
    signal.signal(signal.SIGTERM, lambda *_: os._exit(143))
    if todo:
        workshops = [
            Workshop(options.work / str(i), folders=options.folder or FOLDERS, jobs=options.jobs, python=options.python)
            for i in range(options.at_once)
        ]
        for workshop in workshops:
            workshop.prepare()
        begin, total = time.monotonic(), len(todo)
        lock = threading.Lock()

        def work_in(workshop: Workshop) -> None:
            while True:
                with lock:
                    if not todo:
                        return
                    change = todo.pop(0)
                outcome, by = workshop.try_change(change)
                entry = {**asdict(change), "key": keys[change], "outcome": outcome, "by": by}
                with lock, log.open("a") as out:
                    known[keys[change]] = entry
                    out.write(json.dumps(entry) + "\n")
                    left = (time.monotonic() - begin) / (total - len(todo)) * len(todo)
                    progress = f"[{total - len(todo)}/{total}, {left / 60:.0f} min left]"
                    print(f"{progress} {outcome} ({by}) {change.shown(texts[change.file])}", flush=True)

        with ThreadPoolExecutor(len(workshops)) as pool:
            for future in [pool.submit(work_in, workshop) for workshop in workshops]:
                future.result()
    results = [known[keys[change]] for change in sample if keys[change] in known]
    for change in sample:
        entry = known.get(keys[change])
        if entry is not None and entry["outcome"] == "SURVIVED":
            print(f"SURVIVED ({entry['by']}) {change.shown(texts[change.file])}")
    text, is_enough = summary_of(results)
    print(text)
    return 0 if is_enough else 1


if __name__ == "__main__":
    sys.exit(main())
