"""Measures a corpus: what each engine makes of it, how fast, in how much memory, and whether killed runs end whole.

python -m bench.corpus fetch FOLDER [NAMES_FILE]       source archives of named packages, by pip, 2 GB at most
python -m bench.corpus pack FOLDER COUNT SITE...       archives of what is installed in SITE..., again under other names
python -m bench.corpus engines FOLDER [ENGINE...]      the rows of all engines compared, lines a second, memory
python -m bench.corpus kill FOLDER ROUNDS SEED         SIGKILL of a worker and of the run, in turn, at random moments

Seconds are of processor time of the workers, so that what else the machine does changes little; the native rate is that
of `analyze_files` over the same sources, 512 MiB of them at most, which are in memory, on one thread.
"""

from __future__ import annotations

import os
import random
import shutil
import subprocess
import sys
import tempfile
import time
from pathlib import Path

import pyarrow
from pyarrow import parquet

import quillet
import quillet.corpus
from bench.corpus.archives import fetch, pack
from quillet._languages import available_cores
from quillet.corpus import shards
from quillet.corpus.engines import ENGINES
from quillet.corpus.sources import Columns, read, units_of

VERSION = (3, 12)
# So many bytes of sources tell the native rate.
NATIVE_BYTES = 512 << 20


def same_rows(one: Path, other: Path) -> bool:
    """Whether two runs over the same sources gave the same shards, row by row."""
    for form in ("records", "files"):
        names = sorted(path.name for path in (one / form).iterdir())
        if not names or names != sorted(path.name for path in (other / form).iterdir()):
            return False
        # Their metadata differ: they say how long it took.
        for name in names:
            if not parquet.read_table(one / form / name).equals(parquet.read_table(other / form / name)):
                return False
    return True


def sources_in(folder: Path, most_bytes: int) -> list[tuple[str, bytes]]:
    """The first sources that a folder's archives hold, as many as are wanted in memory."""
    sources = []
    for unit in units_of([str(folder)]):
        for row in read(unit, Columns()):
            if row[3] is None:
                continue
            if (most_bytes := most_bytes - len(row[3])) < 0:
                return sources
            sources.append((row[2], row[3]))
    return sources


def native_rate(folder: Path) -> tuple[float, float]:
    """Lines a second of `analyze_files` as columns and of `corpus.records`, over the same sources in memory."""
    sources = sources_in(folder, NATIVE_BYTES)
    lines = sum(content.count(b"\n") for _, content in sources)
    batches = [
        pyarrow.record_batch({"path": [p for p, _ in part], "content": [c for _, c in part]})
        for part in (sources[at : at + 256] for at in range(0, len(sources), 256))
    ]

    def rate(count_rows: object) -> float:
        best = 0.0
        for _ in range(2):
            started = time.process_time()
            for _ in count_rows():  # type: ignore[operator]
                pass
            best = max(best, lines / (time.process_time() - started))
        return best

    columns = rate(
        lambda: pyarrow.RecordBatchReader.from_stream(quillet.analyze_files(sources, version=VERSION, jobs=1))
    )
    return columns, rate(lambda: quillet.corpus.records(batches, version=VERSION))


def engines(folder: Path, names: list[str]) -> int:
    native, mapped = native_rate(folder)
    print(f"analyze_files {native:,.0f} lines/s, corpus.records {mapped:,.0f} ({mapped / native:.0%})", flush=True)
    differ = []
    with tempfile.TemporaryDirectory() as scratch:
        first: Path | None = None
        for name in names:
            for jobs in (1, 2):
                out = Path(scratch, f"{name}-{jobs}")
                plan = shards.plan_of(str(out), "records", VERSION, Columns(), units_of([str(folder)]))
                started = time.monotonic()
                total = shards.Summary()
                for _, summary in ENGINES[name](plan, range(len(plan.shards)), jobs, None):
                    total += summary
                took = time.monotonic() - started
                rate = total.lines / total.seconds
                print(
                    f"{name:5} {jobs} workers: {total.lines:,} lines in {len(plan.shards)} shards, {took:.1f} s, "
                    f"{rate:,.0f} lines/s of a worker's processor ({rate / native:.0%} of native), "
                    f"{total.megabytes} MB a worker",
                    flush=True,
                )
                if first is None:
                    first = out
                    continue
                if not same_rows(first, out):
                    differ.append(f"{name} with {jobs} workers")
                shutil.rmtree(out)
    print(f"ROWS DIFFER from the first run: {', '.join(differ)}" if differ else "rows of all runs are equal")
    return 1 if differ else 0


def kill(folder: Path, rounds: int, seed: int) -> int:
    """Kills workers and runs in turn, goes on, and compares with a run that nobody killed."""
    chance = random.Random(seed)
    with tempfile.TemporaryDirectory() as scratch:
        # In the processes that are started, too: shards small enough for a kill to come between two.
        Path(scratch, "sitecustomize.py").write_text("import quillet.corpus.shards as s\ns._SHARD_BYTES = 250_000\n")
        environment = {**os.environ, "PYTHONPATH": f"{scratch}{os.pathsep}{os.environ.get('PYTHONPATH', '')}"}

        def command(out: Path) -> list[str]:
            return [sys.executable, "-m", "quillet", "corpus", str(folder), "-o", str(out), "--jobs", "2"]

        whole = Path(scratch) / "whole"
        started = time.monotonic()
        subprocess.run(command(whole), check=True, env=environment, stderr=subprocess.DEVNULL)
        took = time.monotonic() - started
        kills = {"run": 0, "worker": 0}
        wrong = 0
        out = Path(scratch) / "out"
        while sum(kills.values()) < rounds:
            process = subprocess.Popen(command(out), env=environment, stderr=subprocess.DEVNULL)
            what = "run" if sum(kills.values()) % 2 else "worker"
            deadline = time.monotonic() + chance.uniform(0, took)
            while process.poll() is None and time.monotonic() < deadline:
                time.sleep(0.01)
            children = Path(f"/proc/{process.pid}/task/{process.pid}/children")
            workers = children.read_text().split()[1:] if process.poll() is None and children.exists() else []
            if what == "worker" and workers:
                os.kill(int(chance.choice(workers)), 9)
                kills["worker"] += 1
                process.wait()
            elif process.poll() is None:
                process.kill()
                process.wait()
                kills["run"] += 1
            done = subprocess.run(command(out), env=environment, stderr=subprocess.DEVNULL).returncode == 0
            if not done or not same_rows(whole, out) or list(out.rglob(".unfinished*")):
                wrong += 1
            shutil.rmtree(out)
            print(f"\r{kills} killed, {wrong} results were not whole", end="", flush=True)
        rows = sum(parquet.read_metadata(path).num_rows for path in whole.glob("*/part-*"))
        print(f"\n{rows:,} rows each")
        return 1 if wrong else 0


def main(arguments: list[str]) -> int:
    match arguments:
        case ["fetch", folder, *names] if len(names) < 2:
            listed = Path(names[0]) if names else Path(__file__).with_name("names.txt")
            print(fetch(listed.read_text().split(), Path(folder)), "archives")
        case ["pack", folder, count, *sites]:
            print("{} distributions as {} archives".format(*pack(sites, Path(folder), int(count))))
        case ["engines", folder, *names]:
            return engines(Path(folder), names or list(ENGINES))
        case ["kill", folder, rounds, seed]:
            return kill(Path(folder), int(rounds), int(seed))
        case _:
            print(__doc__, file=sys.stderr)
            return 2
    return 0


if __name__ == "__main__":
    print(f"{available_cores()} cores, Python {sys.version.split()[0]}", flush=True)
    sys.exit(main(sys.argv[1:]))
