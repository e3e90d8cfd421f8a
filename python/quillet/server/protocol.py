"""pygls' protocol, with what it leaves open: errors for whatever is no message, requests that are taken back or come
too early, and answers that are plain dictionaries.

The text of a document is kept in the workspaces and not here a second time.
"""

from __future__ import annotations

import json
import logging
import time
from collections.abc import Callable, Iterator
from contextlib import contextmanager
from typing import Any, cast

from lsprotocol import types
from pygls.exceptions import JsonRpcException
from pygls.lsp.server import LanguageServer
from pygls.protocol import LanguageServerProtocol

from quillet._workspace import Columns, RenameError, Stopped
from quillet.server.streams import MessageWriter
from quillet.server.work import Job

log = logging.getLogger(__name__)

PARSE_ERROR = -32700
INVALID_REQUEST = -32600
METHOD_NOT_FOUND = -32601
INVALID_PARAMS = -32602
INTERNAL_ERROR = -32603
NOT_INITIALIZED = -32002
REQUEST_FAILED = -32803
REQUEST_CANCELLED = -32800
CONTENT_MODIFIED = -32801

# What pygls does itself, and well.
_OF_PYGLS = frozenset({"initialize", "initialized", "shutdown", "$/setTrace", "window/workDoneProgress/cancel"})

# What reads all files of a program, the first time it is asked.
_LONG = {
    "textDocument/references": "Looking for references",
    "textDocument/implementation": "Looking for implementations",
    "textDocument/rename": "Looking for what is renamed",
    "workspace/symbol": "Looking for symbols",
    "callHierarchy/incomingCalls": "Looking for callers",
    "typeHierarchy/subtypes": "Looking for subclasses",
}


class Again(Exception):
    """A question made way and is to be asked again."""


class RequestFailed(Exception):
    """A request cannot be done, for a reason that the user is to see."""


class Protocol(LanguageServerProtocol):
    """The protocol of one client."""

    writer: MessageWriter

    def __init__(self, server: LanguageServer, converter: Any) -> None:
        super().__init__(server, converter)
        self._is_initialized = False

    def structure_message(self, data: dict[str, Any]) -> Any:
        """Messages stay as they are until they are handled, where what is wrong with them can be answered."""
        return data

    @property
    def is_shut_down(self) -> bool:
        return bool(self._shutdown)

    def agreed_columns(self) -> Columns:
        """What columns count, as the client and the server agreed."""
        return cast(Columns, str(getattr(self.workspace.position_encoding, "value", self.workspace.position_encoding)))

    # ---- messages ----

    def handle(self, job: Job) -> None:
        """Does what a message asks, and answers it. Raises `Again` for what made way."""
        began = time.perf_counter()
        message = job.message
        if job.method is None:
            self._take_response(message)
            return
        if not isinstance(job.method, str) or not ("id" not in message or isinstance(job.number, (int, str))):
            self.fail(None, INVALID_REQUEST, "a message needs a method, and an identifier that is a number or a text")
        elif job.is_request:
            self._handle_request_of(job)
        else:
            self._handle_notification_of(job)
        log.info("%s %s: %.1f ms", job.method, job.number, (time.perf_counter() - began) * 1e3)

    def _handle_request_of(self, job: Job) -> None:
        problem = self._untimely(job)
        if problem is not None:
            self.fail(job.number, *problem)
            return
        handler = self._handler_of(job.method)
        if handler is None:
            self.fail(job.number, METHOD_NOT_FOUND, f"there is no method {job.method}")
            return
        try:
            params = self._params_of(job)
        except Exception as error:
            log.info("%s: cannot be read: %s", job.method, error)
            self.fail(job.number, INVALID_PARAMS, f"the parameters of {job.method} are not what they have to be")
            return
        if job.method in _OF_PYGLS:
            self._handle_request(job.number, job.method, params)
            self._is_initialized |= job.method == types.INITIALIZE
            return
        try:
            with self._progress(job):
                result = handler(params)
        except Stopped:
            if not job.is_cancelled and not job.is_outdated and job.makes_way:
                raise Again from None
            self.fail(job.number, *(_CANCELLED if job.is_cancelled else _OUTDATED))
        except (RequestFailed, RenameError) as error:
            self.fail(job.number, REQUEST_FAILED, str(error))
        except JsonRpcException as error:
            self.fail(job.number, error.code, error.message)
        except OSError as error:  # a file that has gone, or that nobody may read
            log.info("%s: %s", job.method, error)
            self.reply(job.number, None)
        except Exception as error:
            log.exception("%s failed", job.method)
            self.fail(job.number, INTERNAL_ERROR, f"{job.method}: {type(error).__name__}: {error}")
        else:
            self.reply(job.number, result)

    @contextmanager
    def _progress(self, job: Job) -> Iterator[None]:
        """Tells that a question is worked at that goes over the whole program, to a client that wants to be told."""
        given = job.message.get("params")
        token = given.get("workDoneToken") if job.method in _LONG and isinstance(given, dict) else None
        if not isinstance(token, (int, str)):
            yield
            return
        value = {"kind": "begin", "title": _LONG[job.method], "cancellable": True}
        self.tell("$/progress", {"token": token, "value": value})
        try:
            yield
        finally:
            self.tell("$/progress", {"token": token, "value": {"kind": "end"}})

    def _untimely(self, job: Job) -> tuple[int, str] | None:
        """Why a request cannot be answered now, whatever it asks."""
        if job.is_cancelled:
            return _CANCELLED
        if job.is_outdated and job.tries:
            return _OUTDATED
        if self._shutdown:
            return INVALID_REQUEST, "the server is shutting down"
        if (job.method == types.INITIALIZE) == self._is_initialized:
            if self._is_initialized:
                return INVALID_REQUEST, "the server is initialized already"
            return NOT_INITIALIZED, "the server is not initialized"
        return None

    def _handle_notification_of(self, job: Job) -> None:
        handler = self._handler_of(job.method)
        if handler is None or not self._is_initialized:
            log.info("ignored: %s", job.method)
            return
        try:
            params = self._params_of(job)
            if job.method in _OF_PYGLS:
                self._handle_notification(job.method, params)
            else:
                handler(params)
        except Exception:
            log.exception("%s failed", job.method)

    def _handler_of(self, method: str) -> Callable[[Any], Any] | None:
        return self.fm.builtin_features.get(method) if method in _OF_PYGLS else self.fm.features.get(method)

    def _params_of(self, job: Job) -> Any:
        kind = self.get_message_type(job.method)
        if kind is None:
            return job.message.get("params")
        message = job.message
        if message.get("jsonrpc") != "2.0":
            message = {**message, "jsonrpc": "2.0"}
        return self._converter.structure(message, kind).params

    def _take_response(self, message: dict[str, Any]) -> None:
        """What the client answers to a request of the server's."""
        error = message.get("error")
        try:
            if "id" not in message:
                self.fail(None, INVALID_REQUEST, "a message needs a method or an identifier")
            elif error is not None:
                log.info("the client refused %s: %s", message["id"], error)
                self._request_futures.pop(message["id"], None)
                self._result_types.pop(message["id"], None)
            else:
                kind = self._result_types.pop(message["id"], None)
                result = message.get("result")
                if kind is not None:
                    result = self._converter.structure({"jsonrpc": "2.0", **message, "result": result}, kind).result
                self._handle_response(message["id"], result)
        except Exception:
            log.exception("an answer of the client's failed")

    # ---- answers ----

    def reply(self, number: Any, result: Any) -> None:
        """Answers a request by what can be written as JSON."""
        self._write({"jsonrpc": "2.0", "id": number, "result": result})

    def fail(self, number: Any, code: int, said: str) -> None:
        """Answers a request, or what is none, by an error."""
        log.info("error %d for %s: %s", code, number, said)
        self._write({"jsonrpc": "2.0", "id": number, "error": {"code": code, "message": said}})

    def tell(self, method: str, params: Any) -> None:
        """A notification to the client."""
        self._write({"jsonrpc": "2.0", "method": method, "params": params})

    def _write(self, message: dict[str, Any]) -> None:
        body = json.dumps(message, separators=(",", ":"), default=self._serialize_message)
        self.writer.write_body(body.encode())


_CANCELLED = (REQUEST_CANCELLED, "the request was cancelled")
_OUTDATED = (CONTENT_MODIFIED, "the text was changed")
