"""What there is to do, in order, and who stops it.

Messages come from the reading thread and are taken by the main one, first in, first out: an edit is made behind the
questions that were asked in front of it. What nobody waits for (problems after a keystroke, a first scan) is done when
there is nothing else.

A question that takes long makes way for edits and for what somebody waits for: its work is ended, and it is asked again
behind them, or given up where its own text is no longer the one that it was asked of.
"""

from __future__ import annotations

import time
from _thread import allocate_lock

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable
    from typing import Any

# What a person waits for while typing or pointing.
_URGENT = frozenset(
    f"textDocument/{name}"
    for name in ("completion", "hover", "signatureHelp", "definition", "documentHighlight", "prepareRename")
)
_EDITS = frozenset(f"textDocument/{name}" for name in ("didOpen", "didChange", "didClose"))
# A question that is done after that long is not worth stopping.
_PATIENCE = 0.15
_MOST_TRIES = 3


class Job:
    """A message, and what became of it meanwhile."""

    __slots__ = ("is_cancelled", "is_outdated", "makes_way", "message", "method", "number", "token", "tries", "uri")

    def __init__(self, message: dict[str, Any]) -> None:
        self.message = message
        self.method: Any = message.get("method")
        self.number: Any = message.get("id")  # of a request
        self.uri: str | None = None
        self.token: int | str | None = None  # by which its progress is told
        self.is_cancelled = False  # by the client
        self.is_outdated = False  # its text has changed
        self.makes_way = False  # it is to be asked again
        self.tries = 0
        params = message.get("params")
        if isinstance(params, dict):
            document = params.get("textDocument")
            if isinstance(document, dict) and isinstance(document.get("uri"), str):
                self.uri = document["uri"]
            if isinstance(params.get("workDoneToken"), (int, str)):
                self.token = params["workDoneToken"]

    @property
    def is_request(self) -> bool:
        return self.method is not None and "id" in self.message


class Work:
    """The queue of the main thread. `stop` ends a native question that has taken some seconds."""

    def __init__(self, stop: Callable[[float], None]) -> None:
        self._stop = stop
        self._lock = allocate_lock()
        self._bell = allocate_lock()  # taken until there is something new
        self._bell.acquire()
        self._jobs: list[Job] = []
        self._running: Job | None = None
        self._is_idle_work = False
        self._later: dict[str, tuple[float, Callable[[], None]]] = {}
        self._has_ended = False

    # ---- the reading thread ----

    def put(self, job: Job) -> None:
        """Something more to do."""
        with self._lock:
            self._jobs.append(job)
            if self._is_idle_work:
                self._stop(0)
            elif job.method in _EDITS or job.method in _URGENT:
                self._make_way(job)
            self._ring()

    def _make_way(self, job: Job) -> None:
        running = self._running
        if running is None or not running.is_request:
            return
        if job.method in _EDITS and running.uri == job.uri:
            running.is_outdated = True
        elif running.tries >= _MOST_TRIES or running.method in _URGENT:
            return
        running.makes_way = True
        self._stop(_PATIENCE)

    def cancel(self, number: Any) -> None:
        """Takes a request back, which is answered by an error then."""
        self._cancel(lambda job: bool(job.number == number))

    def cancel_progress(self, token: Any) -> None:
        """The same for one whose progress is told by a token."""
        if token is not None:
            self._cancel(lambda job: bool(job.token == token))

    def _cancel(self, is_meant: Callable[[Job], bool]) -> None:
        with self._lock:
            running = self._running
            if running is not None and running.is_request and is_meant(running):
                running.is_cancelled = True
                self._stop(0)
                return
            for job in self._jobs:
                if job.is_request and is_meant(job):
                    job.is_cancelled = True
                    return

    def end(self, *, at_once: bool = False) -> None:
        """Nothing more will come; `at_once` where nobody waits for what there is."""
        with self._lock:
            self._has_ended = True
            if at_once:
                self._jobs.clear()
                self._stop(0)
            self._ring()

    def _ring(self) -> None:
        if self._bell.locked():
            self._bell.release()

    # ---- the main thread ----

    def _wait(self, seconds: float = -1) -> None:
        """Until there is something new, without an end or so long; the lock is free meanwhile."""
        self._lock.release()
        try:
            self._bell.acquire(True, seconds)
        finally:
            self._lock.acquire()

    def later(self, key: str, action: Callable[[], None], delay: float = 0) -> None:
        """Does something once there is nothing else to do, and in place of what had the same key."""
        with self._lock:
            self._later[key] = (time.monotonic() + delay, action)

    def drop(self, key: str) -> None:
        """Not any more."""
        with self._lock:
            self._later.pop(key, None)

    def again(self, job: Job) -> None:
        """Asks one that made way again, behind the edits and what is urgent by now."""
        job.makes_way = False
        job.tries += 1
        with self._lock:
            place = 0
            for index, other in enumerate(self._jobs):
                if other.method in _EDITS or other.method in _URGENT:
                    place = index + 1
            if any(other.method in _EDITS and other.uri == job.uri for other in self._jobs):
                job.is_outdated = True
            self._jobs.insert(place, job)

    def next(self, proceed: Callable[[], None]) -> Job | Callable[[], None] | None:
        """What is to be done next, a message or something that could wait; None when all is over.

        `proceed` is called in front of it: what was stopped before must not stop this.
        """
        with self._lock:
            self._running = None
            self._is_idle_work = False
            while True:
                if self._jobs:
                    self._running = self._jobs.pop(0)
                    proceed()
                    return self._running
                if self._has_ended:
                    return None
                now = time.monotonic()
                due = min(self._later, key=lambda key: self._later[key][0], default=None)
                if due is None:
                    self._wait()
                elif self._later[due][0] <= now:
                    self._is_idle_work = True
                    proceed()
                    return self._later.pop(due)[1]
                else:
                    self._wait(self._later[due][0] - now)
