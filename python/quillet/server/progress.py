"""What goes over a whole program tells that it is at work: by the token of its request, and where that has none but
takes a while, by one that the client is asked to take.

A client takes requests back by the token as well as by their number.
"""

from __future__ import annotations

from _thread import allocate_lock

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable
    from threading import Timer
    from typing import Any

    from quillet.server.work import Job

    Tell = Callable[[str, Any], None]
    Ask = Callable[[str, Any, Callable[[Any], None]], None]

# What reads all files of a program, the first time it is asked.
TAKES_LONG = {
    "textDocument/references": "Looking for references",
    "textDocument/implementation": "Looking for implementations",
    "textDocument/rename": "Looking for what is renamed",
    "workspace/symbol": "Looking for symbols",
    "callHierarchy/incomingCalls": "Looking for callers",
    "typeHierarchy/subtypes": "Looking for subclasses",
}
# What is done before that is told by nothing but its answer.
DELAY = 0.4


class Progress:
    """Of one request that takes long, told from when it is entered until it is left. `ask` asks the client, whose
    answer comes on the reading thread; without it nothing is told but what the request wants.
    """

    _created = 0

    def __init__(self, job: Job, tell: Tell, ask: Ask | None) -> None:
        self._job, self._tell, self._ask = job, tell, ask
        self._title = TAKES_LONG[job.method]
        self._lock = allocate_lock()
        self._has_begun = False
        self._has_ended = False
        self._timer: Timer | None = None

    def __enter__(self) -> None:
        if self._job.token is not None:
            self._begin()
        elif self._ask is not None:
            from threading import Timer

            self._timer = Timer(DELAY, self._create)
            self._timer.daemon = True
            self._timer.start()

    def __exit__(self, *_: object) -> None:
        if self._timer is not None:
            self._timer.cancel()
        with self._lock:
            self._has_ended = True
            if self._has_begun:
                self._tell("$/progress", {"token": self._job.token, "value": {"kind": "end"}})
            if self._timer is not None:
                self._job.token = None

    def _create(self) -> None:
        with self._lock:
            if self._has_ended or self._ask is None:
                return
            Progress._created += 1
            self._job.token = f"quillet/{Progress._created}"
            self._ask("window/workDoneProgress/create", {"token": self._job.token}, lambda _: self._begin())

    def _begin(self) -> None:
        with self._lock:
            if self._has_ended:
                return
            value = {"kind": "begin", "title": self._title, "cancellable": True}
            self._tell("$/progress", {"token": self._job.token, "value": value})
            self._has_begun = True
