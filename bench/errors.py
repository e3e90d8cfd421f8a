"""What a statement with an error costs beside a valid one of its length.

Simple statements of the running interpreter's library make one source, the same statements with tokens dropped,
doubled and exchanged another; every statement of the second has an error. Both are analysed in one thread, and a
third source tells what is between the statements.

    python bench/errors.py [--statements 6000] [--instructions]

Says microseconds of processor time a statement, the best of some rounds, and with --instructions what
`perf stat` counts.
"""

from __future__ import annotations

import argparse
import random
import re
import subprocess
import sys
import tempfile
import time
from pathlib import Path

if __name__ == "__main__":
    _ROOT = Path(__file__).resolve().parent.parent
    sys.path[:0] = [str(_ROOT / "scripts"), str(_ROOT / "tests" / "python")]

from quillet import analyze, analyze_files
from survey import libraries
from syntax_agreement import PARTNERS, broken, statements_of

#: Stands between the statements: what a bracket or a string leaves open ends there.
BETWEEN = "\npass\n"
ROUNDS = 9
RUNS = 20
WORDS_OF_PLACES = {"async", "await", "break", "class", "continue", "def", "global", "nonlocal", "return", "yield"}

_ONCE = """
import sys
from quillet import analyze_files
source = open(sys.argv[1], "rb").read()
for _ in range(int(sys.argv[2])):
    list(analyze_files([("a.py", source)], jobs=1))
"""


def pairs(count: int) -> list[tuple[str, str]]:
    """Valid statements, and what was made of them."""
    library = libraries()[sys.version_info[:2]]
    statements = [s for path in library.files(20) for s in statements_of(path, library.version)]
    draw = random.Random(3)
    found: list[tuple[str, str]] = []
    while len(found) < count:
        statement = draw.choice(statements)
        if statement.first in PARTNERS | WORDS_OF_PLACES or "\n" in statement.text or statement.text.endswith(":"):
            continue
        text = broken(draw, statement, draw.choice(statements))
        if re.search(r"\n|;|'''|\"\"\"", text):
            continue
        errors = analyze(text).errors
        # One that the grammar rejects, which leaves the lines behind it alone.
        if not errors or errors[0].records or analyze(statement.text).errors:
            continue
        if len(analyze(f"x{BETWEEN}{text}{BETWEEN}x\n").lines) == 5:
            found.append((statement.text, text))
    return found


def seconds(source: bytes) -> float:
    """The processor time of one analysis."""
    best = float("inf")
    for _ in range(ROUNDS):
        start = time.process_time()
        list(analyze_files([("a.py", source)], jobs=1))
        best = min(best, time.process_time() - start)
    return best


def instructions(source: bytes) -> float:
    """What one analysis executes."""
    with tempfile.TemporaryDirectory() as folder:
        path = Path(folder, "source.py")
        path.write_bytes(source)
        counted = []
        for runs in (1, 1 + RUNS):
            command = ["perf", "stat", "-x,", "-e", "instructions:u", sys.executable, "-c", _ONCE, str(path), str(runs)]
            done = subprocess.run(command, check=True, capture_output=True, text=True)
            counted.append(int(done.stderr.strip().splitlines()[-1].split(",")[0]))
    return (counted[1] - counted[0]) / RUNS


def main() -> None:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--statements", type=int, default=6000)
    parser.add_argument("--instructions", action="store_true")
    arguments = parser.parse_args()
    chosen = pairs(arguments.statements)
    sources = [(BETWEEN.join(texts) + "\n").encode() for texts in zip(*chosen, strict=True)]
    between = (BETWEEN * len(chosen)).encode()
    found = [len(analyze(source).errors) for source in sources]
    if found[0] or found[1] < 0.95 * len(chosen):
        sys.exit(f"not measured: {found} errors in {len(chosen)} statements")
    measures = [("us", seconds, 1e6)] + ([("instructions", instructions, 1.0)] if arguments.instructions else [])
    for unit, measure, scale in measures:
        base = measure(between)
        valid, wrong = ((measure(source) - base) / len(chosen) * scale for source in sources)
        print(f"valid {valid:,.2f} {unit}, with an error {wrong:,.2f} {unit}: {wrong / valid:.2f} times")


if __name__ == "__main__":
    main()
