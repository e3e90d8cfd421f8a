"""The tools of `quillet mcp`, on the library of the Model Context Protocol.

Tools run in threads of their own, so that a long answer holds nothing up but itself. Messages of the protocol alone
stand on standard output; what is logged goes to a file, or nowhere.
"""

from __future__ import annotations

import logging
from collections.abc import Callable
from dataclasses import asdict
from threading import Lock
from time import perf_counter
from typing import Annotated, Literal, TypeVar

from mcp.server import MCPServer
from mcp.server.mcpserver.exceptions import ToolError
from mcp.types import CallToolResult, TextContent, ToolAnnotations
from pydantic import Field

from quillet import __version__
from quillet.agents.answers import LIMIT, LIMIT_AT_MOST, Answer, Answers, Asked, Page
from quillet.agents.targets import QuestionError
from quillet.settings import Settings

_log = logging.getLogger("quillet.agents")

_INSTRUCTIONS = """\
Answers about the Python program in the current project, from its files as they are now; nothing is run or changed.
Ask by dotted name (symbol="Shop.total") where the name is known, or by place (path, line, and the name on that line
as symbol). Lines and columns count from 1, columns in UTF-8 bytes. An answer without a mark is certain; [likely] was
inferred, [by name] has nothing but its name to speak for it. Long answers come in pages: ask again with the offset
that is named."""

_READS_ONLY = ToolAnnotations(read_only_hint=True, destructive_hint=False, idempotent_hint=True, open_world_hint=False)

Symbol = Annotated[
    str | None,
    Field(description="A dotted name such as Shop.total or shop.cart.Shop; with path and line the name on that line."),
]
Path = Annotated[str, Field(description="A file, from the project's folder or absolute.")]
PathOrNone = Annotated[str | None, Field(description="A file, from the project's folder or absolute; needs line.")]
Line = Annotated[int | None, Field(description="A line of the file, from 1.")]
Column = Annotated[
    int | None, Field(description="In UTF-8 bytes from 1; needed only where the line has the name twice.")
]
Limit = Annotated[int, Field(ge=1, le=LIMIT_AT_MOST, description="How many items at most.")]
Offset = Annotated[int, Field(ge=0, description="How many items to leave out: the offset that the last page named.")]
Result = Annotated[CallToolResult, Page]

# An answer may take several questions, which a workspace answers one after the other anyway.
_ONE_AT_A_TIME = Lock()

_Tool = TypeVar("_Tool", bound=Callable[..., CallToolResult])


def server_of(settings: Settings) -> MCPServer:
    """The server that answers questions about a project. Raises as `Workspace` does."""
    answers = Answers(settings)
    server = MCPServer("quillet", version=__version__, instructions=_INSTRUCTIONS, log_level="WARNING")

    def tool(function: _Tool) -> _Tool:
        server.add_tool(function, annotations=_READS_ONLY)
        return function

    @tool
    def find_symbol(
        query: Annotated[str, Field(description="A name or a part of one.")],
        kind: Annotated[
            Literal["class", "function", "method", "variable", "attribute"] | None,
            Field(description="Only of this kind."),
        ] = None,
        limit: Limit = LIMIT,
        offset: Offset = 0,
    ) -> Result:
        """Classes, functions, methods and variables of the project whose name is like a query, the best first."""
        return _result(lambda: answers.find_symbol(query, kind, limit, offset))

    @tool
    def outline(
        path: Path,
        depth: Annotated[int, Field(ge=1, le=20, description="Levels: 1 shows what stands at the top alone.")] = 3,
        limit: Limit = LIMIT_AT_MOST,
        offset: Offset = 0,
    ) -> Result:
        """The classes, functions and variables of a file, with the lines that each takes; of broken files, too."""
        return _result(lambda: answers.outline(path, depth, limit, offset))

    @tool
    def definition(
        symbol: Symbol = None,
        path: PathOrNone = None,
        line: Line = None,
        column: Column = None,
        source_lines: Annotated[int, Field(ge=1, le=200, description="How many lines of its source to show.")] = 10,
        limit: Limit = LIMIT,
        offset: Offset = 0,
    ) -> Result:
        """Where a name is defined, with the beginning of its source. Definitions in libraries are shown as well."""
        asked = Asked(symbol, path, line, column)
        return _result(lambda: answers.definition(asked, source_lines, limit, offset))

    @tool
    def references(
        symbol: Symbol = None,
        path: PathOrNone = None,
        line: Line = None,
        column: Column = None,
        at_least: Annotated[
            Literal["certain", "likely", "by name"] | None, Field(description="How sure a reference has to be.")
        ] = None,
        limit: Limit = LIMIT,
        offset: Offset = 0,
    ) -> Result:
        """All places of the project that name a thing: definitions, reads, writes, calls, imports, by file and line."""
        asked = Asked(symbol, path, line, column)
        return _result(lambda: answers.references(asked, at_least, limit, offset))

    @tool
    def callers(
        symbol: Symbol = None,
        path: PathOrNone = None,
        line: Line = None,
        column: Column = None,
        limit: Limit = LIMIT,
        offset: Offset = 0,
    ) -> Result:
        """The calls of a function, each with the function that it stands in."""
        return _result(lambda: answers.callers(Asked(symbol, path, line, column), limit, offset))

    @tool
    def callees(
        symbol: Symbol = None,
        path: PathOrNone = None,
        line: Line = None,
        column: Column = None,
        limit: Limit = LIMIT,
        offset: Offset = 0,
    ) -> Result:
        """The calls that a function makes, each with the function that is called."""
        return _result(lambda: answers.callees(Asked(symbol, path, line, column), limit, offset))

    @tool
    def hierarchy(
        direction: Annotated[Literal["up", "down"], Field(description="up: bases; down: what derives from it.")],
        symbol: Symbol = None,
        path: PathOrNone = None,
        line: Line = None,
        column: Column = None,
        limit: Limit = LIMIT,
        offset: Offset = 0,
    ) -> Result:
        """The bases of a class or what derives from it; of a method what it overrides or is overridden by."""
        asked = Asked(symbol, path, line, column)
        return _result(lambda: answers.hierarchy(asked, direction == "up", limit, offset))

    @tool
    def types(symbol: Symbol = None, path: PathOrNone = None, line: Line = None, column: Column = None) -> Result:
        """What an expression or a name may be: its types, declaration and documentation."""
        return _result(lambda: answers.types(Asked(symbol, path, line, column)))

    @tool
    def problems(path: Path, limit: Limit = LIMIT, offset: Offset = 0) -> Result:
        """What is wrong in a file: syntax errors, imports that lead nowhere, names that are nothing."""
        return _result(lambda: answers.problems(path, limit, offset))

    return server


def _result(ask: Callable[[], Answer]) -> CallToolResult:
    """Asks, and says why there is no answer where there is none."""
    begin = perf_counter()
    try:
        with _ONE_AT_A_TIME:
            answer = ask()
    except (QuestionError, OSError) as problem:
        _log.info("no answer: %s", problem)
        raise ToolError(str(problem)) from problem
    except Exception:
        _log.exception("a fault")
        raise
    _log.info("%d of %d items in %.1f ms", len(answer.data.items), answer.data.total, (perf_counter() - begin) * 1e3)
    return CallToolResult(
        content=[TextContent(type="text", text=answer.text)], structured_content=asdict(answer.data), is_error=False
    )


def serve(settings: Settings, log: str | None) -> None:
    """Answers on standard input and output until the client goes. Raises as `Workspace` does, and `OSError` where the
    log cannot be written.
    """
    # The protocol's library writes to standard error unless somebody else says where a log goes.
    handler: logging.Handler = logging.NullHandler() if log is None else logging.FileHandler(log, encoding="utf-8")
    handler.setFormatter(logging.Formatter("%(asctime)s %(levelname)s %(name)s: %(message)s"))
    logging.basicConfig(level=logging.INFO, handlers=[handler], force=True)
    server_of(settings).run()
