"""A running language server, its messages, and what it costs.

A server runs in a process group of its own; its processor time and memory are those of all its processes.
"""

from __future__ import annotations

import contextlib
import json
import os
import queue
import signal
import subprocess
import threading
import time
from collections.abc import Callable, Sequence
from pathlib import Path
from typing import IO, Any

CAPABILITIES: dict[str, Any] = {
    "general": {"positionEncodings": ["utf-16"]},
    "workspace": {"configuration": True, "workspaceFolders": True},
    "textDocument": {"definition": {"linkSupport": False}, "rename": {"prepareSupport": False}},
}


class ServerError(Exception):
    """A server that answers with an error, ends, or takes too long."""


class Refused(ServerError):
    """An answer that is an error."""

    def __init__(self, said: str, code: int | None = None) -> None:
        super().__init__(said)
        self.code = code


class Connection:
    """A server and its client's end of the pipes. It is initialized unless `initialize` says otherwise."""

    def __init__(
        self,
        name: str,
        command: Sequence[str],
        folder: Path,
        *,
        timeout: float = 300,
        one_core: bool = False,
        settings: dict[str, Any] | None = None,
        capabilities: dict[str, Any] | None = None,
        given: dict[str, Any] | None = None,
        initialize: bool = True,
        environment: dict[str, str] | None = None,
    ) -> None:
        self.name = name
        self.folder = folder
        self.timeout = timeout
        self.settings = settings or {}
        self.capabilities: dict[str, Any] = {}  # the server's
        self._next = 0
        self._answers: dict[Any, queue.Queue[dict[str, Any]]] = {}
        # What the server told and asked, and what came that is no answer to a question.
        self.told: list[dict[str, Any]] = []
        self._changed = threading.Condition()
        self._has_ended = False
        core = min(os.sched_getaffinity(0)) if one_core else None
        self.process = subprocess.Popen(
            [*([] if core is None else ["taskset", "-c", str(core)]), *command],
            stdin=subprocess.PIPE,
            stdout=subprocess.PIPE,
            stderr=subprocess.DEVNULL,
            cwd=folder,
            start_new_session=True,
            env=environment,
        )
        self.usage = Usage(self.process.pid)
        self._write = threading.Lock()
        threading.Thread(target=self._Read, args=(self.process.stdout,), daemon=True).start()
        if initialize:
            self.Initialize(capabilities, given)

    def Initialize(self, capabilities: dict[str, Any] | None = None, given: dict[str, Any] | None = None) -> Any:
        """Greets the server, by the folder that it runs in."""
        uri = self.folder.as_uri()
        answer = self.Ask(
            "initialize",
            {
                "processId": os.getpid(),
                "rootUri": uri,
                "rootPath": str(self.folder),
                "workspaceFolders": [{"uri": uri, "name": self.folder.name}],
                "capabilities": CAPABILITIES if capabilities is None else capabilities,
                **(given or {}),
            },
        )
        self.capabilities = (answer or {}).get("capabilities", {})
        self.Tell("initialized", {})
        return answer

    # --- messages

    def Ask(self, method: str, given: Any) -> Any:
        """The answer to a question. Raises `Refused` for one that is an error."""
        return self.Answer(self.Begin(method, given))

    def Begin(self, method: str, given: Any) -> int:
        """Asks, and does not wait for the answer."""
        self._next += 1
        self._answers[self._next] = queue.Queue()
        self.Send({"jsonrpc": "2.0", "id": self._next, "method": method, "params": given})
        return self._next

    def Answer(self, number: int) -> Any:
        """Waits for the answer to a question that was begun."""
        try:
            answer = self._answers[number].get(timeout=self.timeout)
        except queue.Empty:
            raise ServerError(f"{self.name} did not answer question {number} in {self.timeout:g} s") from None
        finally:
            del self._answers[number]
        if "ended" in answer:
            raise ServerError(f"{self.name} has ended")
        if "error" in answer:
            raise Refused(f"{self.name}: {answer['error'].get('message')}", answer["error"].get("code"))
        return answer.get("result")

    def Tell(self, method: str, given: Any) -> None:
        self.Send({"jsonrpc": "2.0", "method": method, "params": given})

    def Wait(self, wanted: Callable[[dict[str, Any]], bool], begin: int = 0) -> dict[str, Any]:
        """The first thing that the server told or asked since a place of `told` and that is wanted."""
        deadline = time.monotonic() + self.timeout
        with self._changed:
            while True:
                for message in self.told[begin:]:
                    if wanted(message):
                        return message
                begin = len(self.told)
                if self._has_ended or not self._changed.wait(deadline - time.monotonic()):
                    raise ServerError(f"{self.name} did not tell what was waited for")

    def Send(self, message: Any) -> None:
        """Sends a message, or bytes as they are."""
        if not isinstance(message, bytes):
            body = json.dumps(message).encode()
            message = b"Content-Length: %d\r\n\r\n%s" % (len(body), body)
        stdin = self.process.stdin
        assert stdin is not None
        with self._write:
            try:
                stdin.write(message)
                stdin.flush()
            except (OSError, ValueError) as error:
                raise ServerError(f"{self.name} has ended") from error

    def _Read(self, stream: IO[bytes]) -> None:
        while True:
            length = 0
            while (line := stream.readline()) not in (b"\r\n", b"\n", b""):
                if line.lower().startswith(b"content-length:"):
                    length = int(line.split(b":")[1])
            if not line:
                break
            message = json.loads(stream.read(length))
            waiting = None if "method" in message else self._answers.get(message.get("id"))
            if waiting is not None:
                waiting.put(message)
                continue
            if "method" in message and "id" in message:
                self._Reply(message)
            with self._changed:
                self.told.append(message)
                self._changed.notify_all()
        with self._changed:
            self._has_ended = True
            self._changed.notify_all()
        for waiting in list(self._answers.values()):
            waiting.put({"ended": True})

    def _Reply(self, message: dict[str, Any]) -> None:
        """Servers ask for settings and register what they watch; they get those of a section, and a yes."""
        result: Any = None
        if message["method"] == "workspace/configuration":
            result = [self.settings.get(item.get("section"), {}) for item in message["params"]["items"]]
        elif message["method"] == "workspace/workspaceFolders":
            result = [{"uri": self.folder.as_uri(), "name": self.folder.name}]
        with contextlib.suppress(ServerError):
            self.Send({"jsonrpc": "2.0", "id": message["id"], "result": result})

    def Stop(self) -> None:
        """Ends the server and all that it started."""
        self.usage.Look()
        with contextlib.suppress(ServerError, OSError):
            self.timeout = 5
            self.Ask("shutdown", None)
            self.Tell("exit", None)
        with contextlib.suppress(ProcessLookupError):
            os.killpg(self.process.pid, signal.SIGKILL)
        self.process.wait()

    def __enter__(self):  # type: ignore[no-untyped-def]
        return self

    def __exit__(self, *error: object) -> None:
        self.Stop()


class Usage:
    """The processor time and the memory of a process group."""

    def __init__(self, group: int) -> None:
        self._group = group
        self._seconds: dict[int, float] = {}
        self.peak_kib = 0

    def Look(self) -> Usage:
        """Takes the time and the memory of now. A process that has ended keeps the time that was last seen."""
        memory = 0
        for pid in self.LookAtTime():
            with contextlib.suppress(OSError, ValueError, IndexError):
                status = Path(f"/proc/{pid}/status").read_text()
                memory += int(status.split("VmHWM:")[1].split()[0])
        self.peak_kib = max(self.peak_kib, memory)
        return self

    def LookAtTime(self) -> list[int]:
        """Takes the time alone, to the nanosecond; gives the processes."""
        members = self._Members()
        for pid in members:
            with contextlib.suppress(OSError):
                self._seconds[pid] = time.clock_gettime(~pid << 3 | 2)  # the clock of that process
        return members

    @property
    def seconds(self) -> float:
        return sum(self._seconds.values())

    def _Members(self) -> list[int]:
        found = []
        for entry in Path("/proc").iterdir():
            if entry.name.isdigit():
                with contextlib.suppress(OSError):
                    fields = (entry / "stat").read_text().rpartition(")")[2].split()
                    if int(fields[2]) == self._group:
                        found.append(int(entry.name))
        return found
