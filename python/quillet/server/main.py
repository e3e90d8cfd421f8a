"""Serves one client until it goes."""

from __future__ import annotations

import os
import sys
import time
from _signal import SIG_IGN, SIGINT, signal  # the module of that name loads more than all else here
from _thread import start_new_thread

from quillet import __version__
from quillet.server import diagnostics, log, navigation, reading, sync, writing  # noqa: F401
from quillet.server.documents import path_of
from quillet.server.features import FEATURES, PROVIDERS
from quillet.server.json_text import decode
from quillet.server.language_server import Server
from quillet.server.protocol import INVALID_REQUEST, PARSE_ERROR, Again, Protocol
from quillet.server.streams import MalformedFrame, MessageReader, MessageWriter
from quillet.server.work import Job

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable
    from typing import Any

    from quillet._workspace import Columns

# How long what there is to do may take when the client has gone.
_GRACE = 2.0
_LOOK_AT_CLIENT = 1.0


def serve(log_file: str | None = None) -> int:
    """Serves the client at standard input and output; the exit code. Neither stream is used by anything else."""
    source, sink = _take_streams()
    if log_file is not None:
        log.write_to(log_file)
    signal(SIGINT, SIG_IGN)  # one for the editor in the same terminal is none for this
    try:
        return _serve(source, sink)
    except Exception:
        log.exception("the server ended")
        return 1


def _serve(source: int, sink: int) -> int:
    features: dict[str, Callable[[Any], Any]] = {}
    server = Server(Protocol(MessageWriter(sink), features))
    for method, answer in {**FEATURES, **_LIFE}.items():
        features[method] = _answering(answer, server)
    client = _Client(server)
    # Nothing in a thread of these may be the first to load threading, which would take it for the main one.
    start_new_thread(client.read, (MessageReader(source),))
    return client.work()


def _answering(answer: Callable[..., Any], server: Server) -> Callable[[Any], Any]:
    return lambda params: answer(server, params)


def _take_streams() -> tuple[int, int]:
    """Descriptors for messages. What others write to standard output or error goes nowhere."""
    source, sink = os.dup(0), os.dup(1)
    nothing = os.open(os.devnull, os.O_RDWR)
    for descriptor in (0, 1, 2):
        os.dup2(nothing, descriptor)
    os.close(nothing)
    return source, sink


class _Client:
    """The loops of the two threads."""

    def __init__(self, server: Server) -> None:
        self._server = server
        self._work = server.work

    # ---- the reading thread ----

    def read(self, reader: MessageReader) -> None:
        """Puts what the client says into the queue, and ends the work where it says nothing more."""
        try:
            for body in reader.messages():
                self._take(body)
        except Exception:
            log.exception("reading ended")
        log.info("the client has gone")
        self._work.end()
        time.sleep(_GRACE)
        os._exit(1)

    def _take(self, body: bytes | MalformedFrame) -> None:
        if isinstance(body, MalformedFrame):
            self._put_error(PARSE_ERROR, str(body))
            return
        try:
            message = decode(body)
        except (ValueError, RecursionError) as error:
            self._put_error(PARSE_ERROR, f"a message is no JSON: {error}")
            return
        if not isinstance(message, dict):
            self._put_error(INVALID_REQUEST, "a message is no object")
            return
        job = Job(message)
        if job.method == "initialize":
            self._watch_process(message)
        if job.method is None and self._server.protocol.take_at_once(message):
            return
        params = message.get("params")
        given = params if isinstance(params, dict) else {}
        if job.method == "$/cancelRequest":
            self._work.cancel(given.get("id"))
        elif job.method == "window/workDoneProgress/cancel":
            self._work.cancel_progress(given.get("token"))
        elif job.method == "exit":
            self._work.end(at_once=True)
        else:
            self._work.put(job)

    def _put_error(self, code: int, said: str) -> None:
        """An error for what is no message, said in its turn and by the thread that writes."""
        self._work.put(Job({"method": None, "id": None, "error": {"code": code, "message": said}, "malformed": True}))

    def _watch_process(self, message: dict[str, Any]) -> None:
        params = message.get("params")
        number = params.get("processId") if isinstance(params, dict) else None
        if isinstance(number, int) and number > 0:
            start_new_thread(self._end_with, (number,))

    def _end_with(self, process: int) -> None:
        """Ends with the client's process, whose end of the stream may be held by others."""
        while _is_alive(process):
            time.sleep(_LOOK_AT_CLIENT)
        log.info("the client's process has ended")
        self._work.end(at_once=True)
        time.sleep(_GRACE)
        os._exit(1)

    # ---- the main thread ----

    def work(self) -> int:
        """Does what there is to do until the client goes; the exit code."""
        protocol = self._server.protocol
        while True:
            job = self._work.next(self._server.proceed)
            if job is None:
                return 0 if protocol.is_shut_down else 1
            if not isinstance(job, Job):
                job()
            elif job.message.get("malformed") is True:
                error = job.message["error"]
                protocol.fail(None, error["code"], error["message"])
            else:
                try:
                    protocol.handle(job)
                except Again:
                    self._work.again(job)


def _is_alive(process: int) -> bool:
    if os.name == "nt":
        return True
    try:
        os.kill(process, 0)
    except ProcessLookupError:
        return False
    except OSError:
        return True
    # One that has ended and that nobody has asked about is there still.
    try:
        with open(f"/proc/{process}/stat", "rb") as file:
            return file.read().rpartition(b")")[2].split()[:1] != [b"Z"]
    except OSError:
        return sys.platform != "linux"


# ---- how a session begins and ends ----

_ENCODINGS = ("utf-8", "utf-16", "utf-32")


def _initialize(ls: Server, params: Any) -> Any:
    given = params if isinstance(params, dict) else {}
    can = given.get("capabilities")
    wanted = _list(_part(can, "general", "positionEncodings"))
    encoding: Columns = next((each for each in wanted if each in _ENCODINGS), "utf-16")
    ls.projects.columns = encoding
    formats = _list(_part(can, "textDocument", "hover", "contentFormat"))
    ls.has_markdown = not formats or "markdown" in formats
    ls.has_hierarchy = bool(_part(can, "textDocument", "documentSymbol", "hierarchicalDocumentSymbolSupport"))
    ls.has_versions = bool(_part(can, "workspace", "workspaceEdit", "documentChanges"))
    ls.pulls_diagnostics = bool(_part(can, "textDocument", "diagnostic"))
    ls.refreshes_diagnostics = bool(_part(can, "workspace", "diagnostics", "refreshSupport"))
    ls.has_watchers = bool(_part(can, "workspace", "didChangeWatchedFiles", "dynamicRegistration"))
    ls.has_configuration = bool(_part(can, "workspace", "configuration"))
    ls.protocol.has_progress = bool(_part(can, "window", "workDoneProgress"))
    uris = [_part(folder, "uri") for folder in _list(given.get("workspaceFolders"))] or [given.get("rootUri")]
    folders = [path_of(uri) for uri in uris if isinstance(uri, str) and uri]
    if not folders and isinstance(given.get("rootPath"), str):
        folders = [os.path.abspath(given["rootPath"])]
    ls.projects.start(folders, sync.own_settings(given.get("initializationOptions")))
    prepares = bool(_part(can, "textDocument", "rename", "prepareSupport"))
    return {
        "capabilities": {
            "positionEncoding": encoding,
            "textDocumentSync": {"openClose": True, "change": _INCREMENTAL, "save": True},
            **PROVIDERS,
            # No options for clients that do not know of them.
            "renameProvider": PROVIDERS["renameProvider"] if prepares else True,
            "workspace": {"workspaceFolders": {"supported": True, "changeNotifications": True}},
        },
        "serverInfo": {"name": "quillet", "version": __version__},
    }


# As the protocol numbers ways to tell of changes.
_INCREMENTAL = 2


def _part(given: Any, *keys: str) -> Any:
    """What stands in objects within objects, None where there is nothing."""
    for key in keys:
        given = given.get(key) if isinstance(given, dict) else None
    return given


def _list(given: Any) -> list[Any]:
    return given if isinstance(given, list) else []


def _initialized(ls: Server, _: Any) -> None:
    if ls.has_watchers:
        sync.watch_files(ls)
    if ls.has_configuration:
        sync.ask_for_settings(ls)


def _shutdown(ls: Server, _: Any) -> None:
    ls.protocol.is_shut_down = True


_LIFE = {"initialize": _initialize, "initialized": _initialized, "shutdown": _shutdown}
