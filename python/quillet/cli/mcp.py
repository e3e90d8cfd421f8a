"""`quillet mcp`: answers about a program as tools for agents, over standard input and output.

Exit codes: 0 the client went away, 2 wrong usage, a folder or an environment that is none, or a log that cannot be
written.
"""

from __future__ import annotations

import os

from quillet.cli.questions import Settings, fail, project_of, said


def run(given: Settings, log: str | None) -> int:
    """Serves until the client goes, by the settings of the project and what is given on top of them."""
    try:
        from quillet.agents.server import serve
    except ModuleNotFoundError as missing:
        if missing.name is None or missing.name.partition(".")[0] not in ("mcp", "pydantic"):
            raise
        return fail(ValueError("`quillet mcp` needs the package mcp: pip install 'quillet[mcp]'"))
    try:
        from quillet.settings import load_settings

        settings = load_settings(project_of(os.path.join(os.getcwd(), "x")))
        if given.roots:
            settings = settings._replace(roots=tuple(given.roots))
        if given.environment is not None:
            settings = settings._replace(environment=given.environment)
        if given.version is not None:
            settings = settings._replace(version=given.version)
        serve(settings, log)
    except (OSError, ValueError) as problem:
        if isinstance(problem, BrokenPipeError):
            raise
        return fail(said(problem))
    return 0
