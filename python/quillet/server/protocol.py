"""Messages: what is asked is handed to what answers it, and answered, whatever it is.

What a message must hold is said by params.py. Answers are plain dictionaries, and the texts of documents are kept in
the workspaces alone.
"""

from __future__ import annotations

import time

from quillet._workspace import RenameError, Stopped
from quillet.server import log
from quillet.server.json_text import encode
from quillet.server.params import read
from quillet.server.progress import TAKES_LONG, Progress

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable, Mapping
    from typing import Any

    from quillet.server.streams import MessageWriter
    from quillet.server.work import Job

PARSE_ERROR = -32700
INVALID_REQUEST = -32600
METHOD_NOT_FOUND = -32601
INVALID_PARAMS = -32602
INTERNAL_ERROR = -32603
NOT_INITIALIZED = -32002
REQUEST_FAILED = -32803
REQUEST_CANCELLED = -32800
CONTENT_MODIFIED = -32801


class Again(Exception):
    """A question made way and is to be asked again."""


class Encoded(bytes):
    """An answer that is JSON already."""


class RequestFailed(Exception):
    """A request cannot be done, for a reason that the user is to see."""


class Protocol:
    """The protocol of one client. `features` answers the methods that there are, each by its parameters."""

    def __init__(self, writer: MessageWriter, features: Mapping[str, Callable[[Any], Any]]) -> None:
        self._writer = writer
        self._features = features
        # What is done with the client's answers, by the numbers of what it was asked; and whether at once.
        self._asked: dict[Any, tuple[Callable[[Any], None] | None, bool]] = {}
        self._number = 0
        self._is_initialized = False
        self.is_shut_down = False
        # Whether the client takes tokens of progress that it did not give.
        self.has_progress = False

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
            self._handle_request(job)
        else:
            self._handle_notification(job)
        log.info("%s %s: %.1f ms", job.method, job.number, (time.perf_counter() - began) * 1e3)

    def _handle_request(self, job: Job) -> None:
        problem = self._untimely(job)
        if problem is not None:
            self.fail(job.number, *problem)
            return
        feature = self._features.get(job.method)
        if feature is None:
            self.fail(job.number, METHOD_NOT_FOUND, f"there is no method {job.method}")
            return
        try:
            params = read(job.method, job.message.get("params"))
        except Exception as error:
            log.info("%s: cannot be read: %s", job.method, error)
            self.fail(job.number, INVALID_PARAMS, f"the parameters of {job.method} are not what they have to be")
            return
        try:
            if job.method in TAKES_LONG:
                with Progress(job, self.tell, self._ask_at_once if self.has_progress else None):
                    result = feature(params)
            else:
                result = feature(params)
        except Stopped:
            if not job.is_cancelled and not job.is_outdated and job.makes_way:
                raise Again from None
            self.fail(job.number, *(_CANCELLED if job.is_cancelled else _OUTDATED))
        except (RequestFailed, RenameError) as error:
            self.fail(job.number, REQUEST_FAILED, str(error))
        except OSError as error:  # a file that has gone, or that nobody may read
            log.info("%s: %s", job.method, error)
            self.reply(job.number, None)
        except Exception as error:
            log.exception("%s failed", job.method)
            self.fail(job.number, INTERNAL_ERROR, f"{job.method}: {type(error).__name__}: {error}")
        else:
            self._is_initialized |= job.method == "initialize"
            self.reply(job.number, result)

    def _untimely(self, job: Job) -> tuple[int, str] | None:
        """Why a request cannot be answered now, whatever it asks."""
        if job.is_cancelled:
            return _CANCELLED
        if job.is_outdated and job.tries:
            return _OUTDATED
        if self.is_shut_down:
            return INVALID_REQUEST, "the server is shutting down"
        if (job.method == "initialize") == self._is_initialized:
            if self._is_initialized:
                return INVALID_REQUEST, "the server is initialized already"
            return NOT_INITIALIZED, "the server is not initialized"
        return None

    def _handle_notification(self, job: Job) -> None:
        feature = self._features.get(job.method)
        if feature is None or not self._is_initialized:
            log.info("ignored: %s", job.method)
            return
        try:
            feature(read(job.method, job.message.get("params")))
        except Exception:
            log.exception("%s failed", job.method)

    # ---- what the client is asked ----

    def ask(self, method: str, params: Any = None, then: Callable[[Any], None] | None = None) -> None:
        """A request to the client. What it answers is handed on in its turn, unless it is an error."""
        self._ask(method, params, then, at_once=False)

    def _ask_at_once(self, method: str, params: Any, then: Callable[[Any], None]) -> None:
        self._ask(method, params, then, at_once=True)

    def _ask(self, method: str, params: Any, then: Callable[[Any], None] | None, *, at_once: bool) -> None:
        self._number += 1
        number = f"quillet-{self._number}"
        self._asked[number] = then, at_once
        self._write({"jsonrpc": "2.0", "id": number, "method": method, "params": params})

    def take_at_once(self, message: dict[str, Any]) -> bool:
        """Takes an answer of the client's that need not wait for its turn; False for any other one."""
        number = message.get("id")
        _, at_once = self._asked.get(number, (None, False)) if isinstance(number, str) else (None, False)
        if at_once:
            self._take_response(message)
        return at_once

    def _take_response(self, message: dict[str, Any]) -> None:
        if "id" not in message:
            self.fail(None, INVALID_REQUEST, "a message needs a method or an identifier")
            return
        number = message["id"]
        then, _ = self._asked.pop(number, (None, False)) if isinstance(number, str) else (None, False)
        if message.get("error") is not None:
            log.info("the client refused %s: %s", number, message["error"])
        elif then is not None:
            try:
                then(message.get("result"))
            except Exception:
                log.exception("an answer of the client's failed")

    # ---- answers ----

    def reply(self, number: Any, result: Any) -> None:
        """Answers a request by what can be written as JSON, or was."""
        if isinstance(result, Encoded):
            self._writer.write_body(b'{"jsonrpc":"2.0","id":%b,"result":%b}' % (encode(number), result))
        else:
            self._write({"jsonrpc": "2.0", "id": number, "result": result})

    def fail(self, number: Any, code: int, said: str) -> None:
        """Answers a request, or what is none, by an error."""
        log.info("error %d for %s: %s", code, number, said)
        self._write({"jsonrpc": "2.0", "id": number, "error": {"code": code, "message": said}})

    def tell(self, method: str, params: Any) -> None:
        """A notification to the client."""
        self._write({"jsonrpc": "2.0", "method": method, "params": params})

    def _write(self, message: dict[str, Any]) -> None:
        self._writer.write_body(encode(message))


_CANCELLED = (REQUEST_CANCELLED, "the request was cancelled")
_OUTDATED = (CONTENT_MODIFIED, "the text was changed")
