"""Serves one client until it goes."""

from __future__ import annotations

import json
import logging
import os
import signal
import sys
import threading
import time
from functools import partial
from typing import Any

from lsprotocol import types

from quillet import __version__
from quillet.server import diagnostics, navigation, reading, sync, writing  # noqa: F401
from quillet.server.documents import path_of
from quillet.server.features import FEATURES
from quillet.server.language_server import Server
from quillet.server.protocol import INVALID_REQUEST, PARSE_ERROR, Again
from quillet.server.streams import MalformedFrame, MessageReader, MessageWriter
from quillet.server.work import Job

log = logging.getLogger(__name__)

# How long what there is to do may take when the client has gone.
_GRACE = 2.0
_LOOK_AT_CLIENT = 1.0


def serve(log_file: str | None = None) -> int:
    """Serves the client at standard input and output; the exit code. Neither stream is used by anything else."""
    source, sink = _take_streams()
    _log_to(log_file)
    signal.signal(signal.SIGINT, signal.SIG_IGN)  # one for the editor in the same terminal is none for this
    try:
        return _serve(source, sink)
    except Exception:
        log.exception("the server ended")
        return 1


def _serve(source: int, sink: int) -> int:
    server = Server(__version__)
    server.protocol.set_writer(MessageWriter(sink))
    for method, (answer, options) in FEATURES.items():
        server.feature(method, options)(partial(answer, server))
    server.feature(types.INITIALIZE)(partial(_initialize, server))
    server.feature(types.INITIALIZED)(partial(_initialized, server))
    client = _Client(server)
    threading.Thread(target=client.read, args=(MessageReader(source),), daemon=True).start()
    return client.work()


def _take_streams() -> tuple[int, int]:
    """Descriptors for messages. What others write to standard output or error goes nowhere."""
    source, sink = os.dup(0), os.dup(1)
    nothing = os.open(os.devnull, os.O_RDWR)
    for descriptor in (0, 1, 2):
        os.dup2(nothing, descriptor)
    os.close(nothing)
    return source, sink


def _log_to(log_file: str | None) -> None:
    root = logging.getLogger()
    if log_file is None:
        root.addHandler(logging.NullHandler())
        logging.disable()
        return
    logging.basicConfig(
        filename=log_file, level=logging.INFO, format="%(asctime)s %(levelname)s %(name)s: %(message)s", force=True
    )
    logging.getLogger("pygls").setLevel(logging.WARNING)


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
            message = json.loads(body)
        except (ValueError, RecursionError) as error:
            self._put_error(PARSE_ERROR, f"a message is no JSON: {error}")
            return
        if not isinstance(message, dict):
            self._put_error(INVALID_REQUEST, "a message is no object")
            return
        job = Job(message)
        if job.method == "initialize":
            self._watch_process(message)
        if job.method == "$/cancelRequest":
            params = message.get("params")
            self._work.cancel(params.get("id") if isinstance(params, dict) else None)
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
            threading.Thread(target=self._end_with, args=(number,), daemon=True).start()

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


# ---- the first messages ----


def _initialize(ls: Server, params: types.InitializeParams) -> None:
    can = params.capabilities
    text, workspace = can.text_document, can.workspace
    ls.projects.columns = ls.protocol.agreed_columns()
    hover = text and text.hover
    formats = (hover and hover.content_format) or []
    ls.has_markdown = not formats or types.MarkupKind.Markdown in formats
    symbols = text and text.document_symbol
    ls.has_hierarchy = bool(symbols and symbols.hierarchical_document_symbol_support)
    edits = workspace and workspace.workspace_edit
    ls.has_versions = bool(edits and edits.document_changes)
    ls.pulls_diagnostics = bool(text and text.diagnostic)
    ls.refreshes_diagnostics = bool(workspace and workspace.diagnostics and workspace.diagnostics.refresh_support)
    watched = workspace and workspace.did_change_watched_files
    ls.has_watchers = bool(watched and watched.dynamic_registration)
    ls.has_configuration = bool(workspace and workspace.configuration)
    ls.has_progress = bool(can.window and can.window.work_done_progress)
    folders = [path_of(folder.uri) for folder in params.workspace_folders or ()]
    if not folders and (params.root_uri or params.root_path):
        folders = [path_of(params.root_uri) if params.root_uri else os.path.abspath(params.root_path or "")]
    ls.projects.start(folders, sync.own_settings(params.initialization_options))


def _initialized(ls: Server, _: types.InitializedParams) -> None:
    if ls.has_watchers:
        sync.watch_files(ls)
    if ls.has_configuration:
        sync.ask_for_settings(ls)
