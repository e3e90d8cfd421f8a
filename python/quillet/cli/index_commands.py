"""The commands around the index: `index`, `find`, `defs`, `outline`, `stats`, `export`, `report`, `completion`.

As in the rest of the command line, what a command needs is imported when it runs.
"""

from __future__ import annotations

import sys
from collections.abc import Callable, Sequence
from typing import Any

import click

from quillet.cli.find_options import INDEX_OPTION, OPTIONS, ROOT_OPTION, Option
from quillet.cli.options import PathArgument, exclude_option, python_option


def _options(options: Sequence[Option]) -> Callable[[Callable[..., None]], Callable[..., None]]:
    """A decorator that gives a command these options, in their order."""

    def add(command: Callable[..., None]) -> Callable[..., None]:
        for option in reversed(options):
            settings: dict[str, Any] = {"help": option.help}
            if option.choices:
                settings["type"] = click.Choice(option.choices)
            elif option.takes_value:
                settings |= {
                    "metavar": option.metavar,
                    "type": PathArgument() if option.is_path else str,
                }
                if option.repeated:
                    settings["multiple"] = True
            else:
                settings["is_flag"] = True
            command = click.option(*option.flags, option.parameter, **settings)(command)
        return command

    return add


_index_option = _options([INDEX_OPTION])
_index_options = _options([INDEX_OPTION, ROOT_OPTION])


@click.command()
@click.argument("paths", nargs=-1, metavar="[PATH]...", type=PathArgument())
@click.option("-o", "--output", metavar="FILE", type=PathArgument(), help="The index; .quillet-index without it.")
@click.option(
    "--format",
    "form",
    type=click.Choice(["index", "sqlite", "parquet"]),
    default="index",
    show_default=True,
    help="index to ask and to update; sqlite and parquet (needs pyarrow) write all records as tables instead.",
)
@python_option
@click.option(
    "-j",
    "--jobs",
    type=click.IntRange(1, 1024),
    metavar="N",
    help="Threads that analyse; one a core without it.",
)
@click.option("--no-gitignore/--gitignore", default=None, help="Index what .gitignore files exclude, too.")
@exclude_option
@click.option("--force", is_flag=True, help="Analyse all files again, also those that seem not to have changed.")
@click.option("--watch", is_flag=True, help="Go on, and update the index when a file changes.")
@click.option("-q", "--quiet", is_flag=True, help="Say nothing of what was done.")
def index(
    paths: tuple[str, ...],
    output: str | None,
    form: str,
    version: tuple[int, int] | None,
    jobs: int | None,
    no_gitignore: bool | None,
    exclude: tuple[str, ...],
    force: bool,
    watch: bool,
    quiet: bool,
) -> None:
    """Makes or updates the index of files and folders.

    Files that did not change are not analysed again, files that are gone leave the index. Without PATH
    everything that was indexed before is brought up to date.

    \b
        quillet index .
        quillet index src tests -o code.index
        quillet index . --watch
    """
    from quillet.cli.index import run
    from quillet.index.update import Settings

    gitignore = None if no_gitignore is None else not no_gitignore
    settings = Settings(paths=paths, version=version, jobs=jobs, gitignore=gitignore, force=force, exclude=exclude)
    sys.exit(run(settings, output=output, form=form, watch=watch, quiet=quiet))


@click.command()
@click.argument("name")
@_options(OPTIONS)
def find(name: str, **parameters: Any) -> None:
    """Finds the places that say something of NAME, as path:line:column and the source line.

    NAME is a name or a dotted name as it stands in the source, .attr for anything that ends in it, or a
    pattern with * and ?. Exit codes are those of grep: 0 found, 1 nothing found, 2 an error.

    \b
        quillet find os.path.join --call
        quillet find .total --set
        quillet find 'test_*' --set --scope TestShop
        quillet find Shop.price --return --long
        quillet find Shop.total --resolve
    """
    from quillet.cli.find import ask

    sys.exit(ask(name, **parameters))


@click.command()
@click.argument("file", type=PathArgument())
@click.option("--imports", is_flag=True, help="The names that imports bind, too.")
@click.option("--json", "as_json", is_flag=True, help="A JSON object a record.")
@_index_option
def defs(file: str, imports: bool, as_json: bool, index: str | None) -> None:
    """Lists what FILE defines: classes, functions, and what its module and classes set.

    The file is read as it is now; an index need not know it.

    \b
        quillet defs examples/shop.py
    """
    from quillet.cli.defs import run

    sys.exit(run(file, index=index, as_json=as_json, imports=imports))


@click.command()
@click.argument("file", type=PathArgument())
@click.option("--json", "as_json", is_flag=True, help="A JSON object a class or function.")
@_index_option
def outline(file: str, as_json: bool, index: str | None) -> None:
    """Shows the classes and functions of FILE as a tree, with parameters and hints.

    \b
        quillet outline examples/shop.py
    """
    from quillet.cli.outline import run

    sys.exit(run(file, index=index, as_json=as_json))


@click.command()
@click.option("--json", "as_json", is_flag=True, help="One JSON object.")
@_index_options
def stats(as_json: bool, index: str | None, roots: tuple[str, ...]) -> None:
    """Says what the files of the index hold: lines, records by kind, the names most used.

    \b
        quillet stats
    """
    from quillet.cli.stats import run

    sys.exit(run(index=index, roots=roots, as_json=as_json))


@click.command()
@click.argument("form", metavar="FORMAT", type=click.Choice(["tags", "scip", "jsonl", "sqlite", "parquet"]))
@click.option("-o", "--output", metavar="FILE", type=PathArgument(), help='Where to; "-" is standard output.')
@_index_options
def export(form: str, output: str | None, index: str | None, roots: tuple[str, ...]) -> None:
    """Writes what the files of the index say: as tags (for editors), scip (for code intelligence servers),
    jsonl (for programs), sqlite or parquet (tables; parquet needs pyarrow).

    Without -o tags go to "tags", scip to "index.scip", jsonl to standard output, tables to "quillet.sqlite"
    and "quillet.parquet".

    \b
        quillet export tags
        quillet export scip -o index.scip
        quillet export jsonl | head
        quillet export sqlite -o code.sqlite
    """
    from quillet.cli.export import run

    sys.exit(run(form, output=output, index=index, roots=roots))


@click.command()
@click.argument("paths", nargs=-1, metavar="[PATH]...", type=PathArgument())
@click.option("-o", "--output", metavar="DIR", type=PathArgument(), required=True, help="The folder of the site.")
@python_option
@click.option(
    "-j",
    "--jobs",
    type=click.IntRange(1, 1024),
    metavar="N",
    help="Threads that read and write; one a core without it.",
)
@click.option("--no-gitignore", is_flag=True, help="Show what .gitignore files exclude, too.")
@exclude_option
def report(
    paths: tuple[str, ...],
    output: str,
    version: tuple[int, int] | None,
    jobs: int | None,
    no_gitignore: bool,
    exclude: tuple[str, ...],
) -> None:
    """Writes a static site that is read from disk: files, source with linked names, syntax errors.

    PATH are files and folders, without one the working folder. DIR is new, empty, or holds an earlier
    report, which is replaced when the new one is whole.

    \b
        quillet report -o site
        quillet report src tests -o site
    """
    from quillet.cli.report import run
    from quillet.report.site import Settings

    sys.exit(run(paths, output, Settings(version, jobs), gitignore=not no_gitignore, exclude=exclude))


@click.command()
@click.argument("shell", type=click.Choice(["bash", "zsh", "fish"]))
def completion(shell: str) -> None:
    """Prints the script that completes commands, options and files in a shell.

    \b
        eval "$(quillet completion bash)"
        quillet completion fish > ~/.config/fish/completions/quillet.fish
    """
    from click.shell_completion import get_completion_class

    found = get_completion_class(shell)
    assert found is not None
    command = click.get_current_context().find_root().command
    click.echo(found(command, {}, "quillet", "_QUILLET_COMPLETE").source())


COMMANDS = (index, find, defs, outline, stats, export, report, completion)
