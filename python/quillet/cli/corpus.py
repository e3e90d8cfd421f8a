"""`quillet corpus`: more code than one machine holds, to Parquet, by processes or by an engine; and its names."""

from __future__ import annotations

import os
import sys
import time
from collections.abc import Sequence
from contextlib import closing, contextmanager
from typing import Any

import click

from quillet.cli.options import PathArgument, PythonVersion

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterator

    from quillet.corpus.shards import Plan, Summary


class _Version(PythonVersion):
    name = "X.Y|auto"

    def convert(self, value: object, param: click.Parameter | None, ctx: click.Context | None) -> Any:
        return value if value == "auto" else super().convert(value, param, ctx)


class _Group(click.Group):
    """Runs over sources, unless the first argument is a command."""

    def parse_args(self, ctx: click.Context, args: list[str]) -> list[str]:
        if args and args[0] not in self.commands and args[0] not in ctx.help_option_names:
            args = ["run", *args]
        return super().parse_args(ctx, args)


@click.group(cls=_Group)
def corpus() -> None:
    """Analyses more code than one machine holds, to Parquet, and finds names in it.

    `quillet corpus SOURCE... -o OUT` is `quillet corpus run SOURCE... -o OUT`; a SOURCE that is called as a command is
    given as ./find.
    """


@corpus.command()
@click.argument("sources", nargs=-1, required=True, metavar="SOURCE...", type=PathArgument(exists=True))
@click.option("-o", "--output", required=True, metavar="OUT", type=PathArgument(), help="The folder to write.")
@click.option(
    "--engine",
    type=click.Choice(["local", "dask", "ray", "spark"]),
    default="local",
    show_default=True,
    help="What runs the workers.",
)
@click.option(
    "--scheduler",
    metavar="ADDRESS",
    help="Where the engine is; without it, one is started on this machine.",
)
@click.option(
    "--jobs", type=click.IntRange(1, 1024), metavar="N", help="Workers on this machine; one a core without it."
)
@click.option(
    "--python",
    "version",
    type=_Version(),
    help="The version of Python that the sources are written for; with auto each source shows it.",
)
@click.option("--occurrences", is_flag=True, help="Write names in place of records.")
@click.option("--path-column", default="path", show_default=True, metavar="NAME", help="In Parquet: a source's name.")
@click.option("--content-column", default="content", show_default=True, metavar="NAME", help="In Parquet: its text.")
@click.option("--package-column", default="package", show_default=True, metavar="NAME", help="In Parquet: its project.")
def run(
    sources: tuple[str, ...],
    output: str,
    engine: str,
    scheduler: str | None,
    jobs: int | None,
    version: Any,
    occurrences: bool,
    path_column: str,
    content_column: str,
    package_column: str,
) -> None:
    """Analyses SOURCES and writes their records to OUT/records and a row a source to OUT/files, as Parquet.

    SOURCE is a Parquet file, a folder, a tar or zip archive, a wheel or an sdist, or a folder of any of these. A run
    that was stopped, however, goes on where it was when it is started again.

    \b
        quillet corpus mirror -o out --python auto
        quillet corpus mirror -o out --engine dask --scheduler tcp://head:8786
        quillet corpus find json.loads out
    """
    from quillet.corpus.sources import Columns

    form = "occurrences" if occurrences else "records"
    columns = Columns(path_column, content_column, package_column)
    sys.exit(_guarded(lambda: _run(sources, output, engine, scheduler, jobs, version, form, columns)))


@corpus.command()
@click.argument("name")
@click.argument("out", type=PathArgument())
@click.option("--kind", "kinds", multiple=True, metavar="KIND", help="Only records of this kind; may be repeated.")
def find(name: str, out: str, kinds: tuple[str, ...]) -> None:
    """Shows where NAME stands in the corpus at OUT; ".name" is an attribute of any object.

    \b
        quillet corpus find json.loads out --kind called
    """

    def show() -> int:
        from quillet.cli.show import printable
        from quillet.corpus.query import find as records_of
        from quillet.tarvex import _host

        found = 0
        for record in records_of(out, name, kinds):
            found += 1
            what = _host.DescribeRecord(record["kind"], record["detail"], record["is_parameter"])
            place = f"{record['source']}/{record['path']}:{record['line']}:{record['column']}"
            print(f"{printable(place)}: {printable(record['name'])} {printable(what)}")
        return 0 if found else 1

    sys.exit(_guarded(show))


def _guarded(command: Any) -> int:
    """Runs a command; what keeps it from its work is told in a line."""
    from quillet.corpus.shards import CorpusError

    try:
        import pyarrow  # noqa: F401

        return int(command())
    except ModuleNotFoundError as error:
        problem: object = f"this needs the package {error.name}; install it with: pip install pyarrow"
    except CorpusError as error:
        problem = error
    print(f"quillet: {problem}", file=sys.stderr)
    return 2


def _run(
    sources: Sequence[str],
    output: str,
    engine: str,
    scheduler: str | None,
    jobs: int | None,
    version: Any,
    form: str,
    columns: Any,
) -> int:
    from quillet._languages import available_cores, language_version
    from quillet.corpus.engines import ENGINES
    from quillet.corpus.shards import Summary, plan_of, remove_leftovers, summary_of
    from quillet.corpus.sources import units_of

    # Of this machine, whatever the workers' is.
    version = version or language_version(None)
    plan = plan_of(output, form, version, columns, units_of(sources))
    with _only_run_in(plan.out):
        remove_leftovers(plan)
        numbers = range(len(plan.shards))
        left = [shard for shard in numbers if not plan.is_done(shard)]
        total = Summary()
        for shard in sorted(set(numbers) - set(left)):
            total += summary_of(plan, shard)
        if left:
            done = ENGINES[engine](plan, left, jobs or available_cores(), scheduler)
            with closing(done):  # type: ignore[type-var]
                total += _watch(plan, done, len(left))
            remove_leftovers(plan)  # of workers that were killed meanwhile
    print(_told(total, len(plan.shards)), file=sys.stderr)
    return 0


def _watch(plan: Plan, done: Iterator[tuple[int, Summary]], count: int) -> Summary:
    """Shows how far a run is, how fast, and how long it takes yet."""
    from quillet.cli.progress import Progress
    from quillet.corpus.shards import Summary
    from quillet.corpus.sources import weight_of

    weights = [weight_of(units) for units in plan.shards]
    left = sum(weights[shard] for shard in range(len(weights)) if not plan.is_done(shard))
    total = Summary()
    weight = 0
    started = time.monotonic()
    with Progress("corpus", count) as progress:
        for shard, summary in done:
            total += summary
            weight += weights[shard]
            seconds = max(time.monotonic() - started, 1e-3)
            remaining = seconds * (left - weight) / weight if weight else 0
            progress.relabel(f"corpus  {total.lines / seconds:,.0f} lines/s  {_duration(remaining)} left")
            progress.advance()
    return total


def _duration(seconds: float) -> str:
    whole = round(seconds)
    if whole < 60:
        return f"{whole} s"
    if whole < 3600:
        return f"{whole // 60} min {whole % 60:02} s"
    return f"{whole // 3600} h {whole % 3600 // 60:02} min"


def _told(total: Summary, shards: int) -> str:
    return (
        f"quillet: {total.files:,} files, {total.lines:,} lines, {total.rows:,} rows in {shards:,} shards; "
        f"{total.errors:,} syntax errors, {total.problems:,} files with a problem; "
        f"{total.seconds:,.0f} s of processor time, {total.megabytes:,} MB a worker at most"
    )


@contextmanager
def _only_run_in(folder: str) -> Iterator[None]:
    """Refuses a second run over the same folder, whose files the first one's would be taken for leftovers."""
    from quillet.corpus.shards import CorpusError

    try:
        import fcntl
    except ImportError:  # not on Windows
        yield
        return
    handle = os.open(os.path.join(folder, ".lock"), os.O_RDWR | os.O_CREAT | os.O_CLOEXEC, 0o666)
    try:
        try:
            fcntl.flock(handle, fcntl.LOCK_EX | fcntl.LOCK_NB)
        except OSError:
            raise CorpusError(f"another run is at work in {folder}") from None
        yield
    finally:
        os.close(handle)
