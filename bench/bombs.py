"""Inputs made to do harm, each unit a million times, through Python and the commands, on stacks of half a mebibyte.

The inputs are those of bench/scaling.cc, which tries the core alone. Here each is a file: `quillet.analyze` takes it in
a thread with a small stack and in the main thread of a process that has no larger one, and `analyze`, `index`, `find`,
`outline` and `goto` are run on it. Processor time by the byte and the memory that a process takes beyond an idle one,
by the byte, are said; named as faults are those that end by a signal, take too long, take more memory than they may,
or, with --interrupt, do not end within a second of Ctrl-C in the middle of their work. Exit code 1 where there are any.
`quillet.analyze`, whose result is kept in memory, may take --most-memory for each byte; a command a gibibyte, or ten
times the size of the file where that is more.

    python bench/bombs.py [--scaling build/release/bench/quillet_scaling] [--count N] [--most-bytes N] [--only TEXT]
"""

from __future__ import annotations

import argparse
import os
import resource
import signal
import subprocess
import sys
import tempfile
import time
from pathlib import Path
from typing import NamedTuple

_STACK = 512 << 10
# What a file may take of a command.
_COMMAND_MEMORY = 1 << 30
_COMMAND_MEMORY_PER_BYTE = 10
_IN_A_THREAD = """
import sys, threading, quillet
text = open(sys.argv[1], 'rb').read().decode('utf-8', 'surrogateescape')
threading.stack_size(int(sys.argv[2]))
problems = []
def analyze():
    try:
        quillet.analyze(text)
    except (OverflowError, MemoryError, SyntaxError, UnicodeError) as error:
        problems.append(error)
thread = threading.Thread(target=analyze)
thread.start()
thread.join()
print(*problems)
"""
_IN_MAIN = (
    _IN_A_THREAD.split("threading.stack_size")[0]
    + _IN_A_THREAD[_IN_A_THREAD.index("problems = []") : _IN_A_THREAD.index("thread = ")]
    + "analyze()\nprint(*problems)\n"
)


class Way(NamedTuple):
    """A way to meet an input."""

    name: str
    command: list[str]

    def most_memory(self, size: int, in_python: float) -> float:
        """How many bytes it may take for so many bytes."""
        if self.name in ("thread", "main"):
            return in_python * size
        return max(_COMMAND_MEMORY, _COMMAND_MEMORY_PER_BYTE * size)


def ways(file: Path) -> list[Way]:
    """The commands for a file, in the order in which they are to run: questions need the index."""
    quillet = [sys.executable, "-m", "quillet"]
    return [
        Way("thread", [sys.executable, "-c", _IN_A_THREAD, str(file), str(_STACK)]),
        Way("main", [sys.executable, "-c", _IN_MAIN, str(file)]),
        Way("analyze", [*quillet, "analyze", file.name]),
        Way("index", [*quillet, "index", ".", "-q"]),
        Way("find", [*quillet, "find", "a"]),
        Way("outline", [*quillet, "outline", file.name]),
        Way("goto", [*quillet, "goto", f"{file.name}:1:1"]),
    ]


class Cost(NamedTuple):
    """What a run took."""

    seconds: float  # of the processor
    memory: int  # bytes at most
    status: int  # below 0: the signal
    late: float  # seconds between Ctrl-C and the end
    said: str


def run(way: Way, folder: Path, most_seconds: float, interrupt_after: float | None = None) -> Cost:
    """Runs a command in a folder, with a main thread of a small stack."""
    with tempfile.TemporaryFile() as output:
        process = subprocess.Popen(
            way.command,
            cwd=folder,
            stdin=subprocess.DEVNULL,
            stdout=subprocess.DEVNULL,
            stderr=output,
            preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_STACK, (_STACK, _STACK)),
        )
        end = time.monotonic() + most_seconds
        sent = 0.0
        while True:
            pid, raw, usage = os.wait4(process.pid, os.WNOHANG)
            now = time.monotonic()
            if pid:
                break
            if interrupt_after is not None and not sent and now > end - most_seconds + interrupt_after:
                process.send_signal(signal.SIGINT)
                sent = now
            if now > end:
                process.kill()
                _, raw, usage = os.wait4(process.pid, 0)
                break
            time.sleep(0.01)
        process.returncode = os.waitstatus_to_exitcode(raw)
        output.seek(0)
        said = output.read().decode(errors="replace").strip()
        late = now - sent if sent else 0.0
        return Cost(usage.ru_utime + usage.ru_stime, usage.ru_maxrss << 10, process.returncode, late, said)


def faults_of(cost: Cost, idle: int, most_memory: float) -> str:
    """What is wrong with a run; empty where nothing is."""
    if cost.status < 0:
        return f"ended by signal {-cost.status}"
    if "Traceback" in cost.said:
        return "traceback"
    memory = cost.memory - idle
    return f"{memory >> 20} MiB of memory" if memory > most_memory else ""


def main() -> int:
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--scaling", default="build/release/bench/quillet_scaling")
    parser.add_argument("--count", type=int, default=1_000_000)
    parser.add_argument("--most-bytes", type=int, default=50_000_000, help="of an input, which is repeated less often")
    parser.add_argument("--most-memory", type=float, default=400.0, help="bytes a byte, in Python")
    parser.add_argument("--most-seconds", type=float, default=600.0)
    parser.add_argument("--interrupt", action="store_true", help="also ends each in the middle by Ctrl-C")
    parser.add_argument("--only", default="", metavar="TEXT")
    parser.add_argument("--skip", type=int, default=0, help="so many of the inputs, as after a run that was stopped")
    parser.add_argument("--ways", default="", metavar="NAME,...")
    arguments = parser.parse_args()
    scaling = str(Path(arguments.scaling).resolve())
    listed = subprocess.run([scaling, "--list"], capture_output=True, text=True, check=True).stdout.splitlines()
    names = [line[:44].strip() for line in listed if arguments.only in line[:44]][arguments.skip :]
    bad = 0
    with tempfile.TemporaryDirectory() as name:
        folder = Path(name)
        file = folder / "a.py"
        wanted = [way for way in ways(file) if not arguments.ways or way.name in arguments.ways.split(",")]
        file.write_text("a\n")
        idle = {way.name: run(way, folder, arguments.most_seconds).memory for way in wanted}
        print(f"{'input':40} {'bytes':>9}", *(f"{way.name:>14}" for way in wanted), " (ns and bytes of memory a byte)")
        for shape in names:
            (folder / ".quillet-index").unlink(missing_ok=True)
            count = arguments.count
            while True:
                subprocess.run([scaling, "--count", str(count), "--only", shape, "--write", file], check=True)
                if file.stat().st_size <= arguments.most_bytes:
                    break
                count = count * arguments.most_bytes // file.stat().st_size
            size = file.stat().st_size
            cells, faults = [], []
            for way in wanted:
                cost = run(way, folder, arguments.most_seconds)
                cells.append(f"{cost.seconds / size * 1e9:7.0f} {(cost.memory - idle[way.name]) / size:6.0f}")
                fault = faults_of(cost, idle[way.name], way.most_memory(size, arguments.most_memory))
                if not fault and arguments.interrupt and cost.seconds > 1:
                    ended = run(way, folder, arguments.most_seconds, cost.seconds / 2)
                    fault = f"ends {ended.late:.1f} s behind Ctrl-C" if ended.late > 1 else ""
                if fault:
                    faults.append(f"{way.name}: {fault}")
            bad += bool(faults)
            print(f"{shape:40} {size:9}", *cells, "" if not faults else "  <-- " + "; ".join(faults), flush=True)
    print(f"{len(names)} inputs, {bad} of them bad")
    return 1 if bad else 0


if __name__ == "__main__":
    sys.exit(main())
