"""Per-statement analysis of Python code: what each statement tells about names.

`analyze` takes a whole source, `analyze_files` many files on all cores, and `bind` says which variable each
name of a source is; `Workspace` answers questions about whole programs. `quillet.tarvex` is the engine below,
which takes one logical line at a time; `quillet.logicalline`, `quillet.optpgen`, `quillet.symbolinfo` and
`quillet.strutils` are what it works with.
"""

from __future__ import annotations

__version__ = "0.1.0"

# As typing has it, which takes longer to load than a question to answer.
TYPE_CHECKING = False
if TYPE_CHECKING:
    from quillet._batch import Definition, FileAnalyses, FileAnalysis, FileRecord, FileRecords, analyze_files
    from quillet._names import FileBindings, FileOccurrences, Occurrence, Scope, Symbol, bind
    from quillet._records import Record, RecordKind
    from quillet._source import SourceEncodingError
    from quillet._workspace import (
        Call,
        Completion,
        Edit,
        Hover,
        Location,
        OutlineItem,
        Parameter,
        Problem,
        RenameError,
        Signature,
        Stopped,
        Workspace,
        WorkspaceSymbol,
    )
    from quillet.host import Analysis, Line, analyze, analyzer_for, language_version

__all__ = [
    "Analysis",
    "Call",
    "Completion",
    "Definition",
    "Edit",
    "FileAnalyses",
    "FileAnalysis",
    "FileBindings",
    "FileOccurrences",
    "FileRecord",
    "FileRecords",
    "Hover",
    "Line",
    "Location",
    "Occurrence",
    "OutlineItem",
    "Parameter",
    "Problem",
    "Record",
    "RecordKind",
    "RenameError",
    "Scope",
    "Signature",
    "SourceEncodingError",
    "Stopped",
    "Symbol",
    "Workspace",
    "WorkspaceSymbol",
    "analyze",
    "analyze_files",
    "analyzer_for",
    "bind",
    "language_version",
]

_HOMES = {
    "Call": "_workspace",
    "Completion": "_workspace",
    "Definition": "_batch",
    "Edit": "_workspace",
    "FileAnalyses": "_batch",
    "FileAnalysis": "_batch",
    "FileBindings": "_names",
    "FileOccurrences": "_names",
    "FileRecord": "_batch",
    "FileRecords": "_batch",
    "Hover": "_workspace",
    "Location": "_workspace",
    "Occurrence": "_names",
    "OutlineItem": "_workspace",
    "Parameter": "_workspace",
    "Problem": "_workspace",
    "Record": "_records",
    "RecordKind": "_records",
    "RenameError": "_workspace",
    "Scope": "_names",
    "Signature": "_workspace",
    "SourceEncodingError": "_source",
    "Stopped": "_workspace",
    "Symbol": "_names",
    "Workspace": "_workspace",
    "WorkspaceSymbol": "_workspace",
    "analyze_files": "_batch",
    "bind": "_names",
}


def __getattr__(name: str) -> object:
    # The engine is loaded when something of it is first used, so that what needs none of it (such as
    # the command line's --help) starts quickly.
    if name not in __all__:
        raise AttributeError(f"module {__name__!r} has no attribute {name!r}")
    from importlib import import_module

    value = getattr(import_module(f"{__name__}.{_HOMES.get(name, 'host')}"), name)
    globals()[name] = value
    return value


def __dir__() -> list[str]:
    # What a user can use: not what this file works with, and not the modules that the names above come from.
    own = {"TYPE_CHECKING", "annotations"}
    return sorted({*__all__, *(name for name in {*globals()} - own if name[0] != "_" or name.startswith("__"))})
