"""A Chromium without a window, driven through a pipe by its own protocol: real keys, real clicks, no library.

`page = browser.open(path)` loads a page, `page.value("...")` evaluates an expression in it, `page.press` and
`page.type_text` send keys, `page.click` clicks the middle of an element.
"""

from __future__ import annotations

import base64
import json
import os
import shutil
import subprocess
import time
from itertools import count
from pathlib import Path
from typing import Any

import pytest

_KEYS = {"/": ("Slash", 191), "Enter": ("Enter", 13), "Escape": ("Escape", 27), "Tab": ("Tab", 9)}
_KEYS |= {"ArrowDown": ("ArrowDown", 40), "ArrowUp": ("ArrowUp", 38), "Backspace": ("Backspace", 8)}


def chromium() -> str:
    """The browser's executable; skips the test where there is none."""
    for name in ("chromium", "chromium-browser", "google-chrome", "chrome"):
        path = shutil.which(name)
        if path is not None:
            return path
    pytest.skip("no Chromium is installed")


class Browser:
    """A running browser. `close` ends it."""

    def __init__(self, profile: Path) -> None:
        executable = chromium()
        fcntl = pytest.importorskip("fcntl")
        to_browser, self._out = os.pipe()
        self._in, from_browser = os.pipe()
        arguments = [
            "--headless",
            "--no-sandbox",
            "--disable-gpu",
            "--disable-dev-shm-usage",
            "--hide-scrollbars",
            "--remote-debugging-pipe",
            f"--user-data-dir={profile}",
            "about:blank",
        ]

        def take_pipes() -> None:  # the browser reads from 3 and writes to 4
            ends = os.dup(to_browser), os.dup(from_browser)
            for number, end in zip((3, 4), [fcntl.fcntl(end, fcntl.F_DUPFD, 10) for end in ends], strict=True):
                os.dup2(end, number)

        self._process = subprocess.Popen(
            [executable, *arguments],
            preexec_fn=take_pipes,
            close_fds=False,
            # A sanitizer that Python was started with is none of the browser's.
            env={name: value for name, value in os.environ.items() if name != "LD_PRELOAD"},
            stdout=subprocess.DEVNULL,
            stderr=subprocess.DEVNULL,
        )
        os.close(to_browser)
        os.close(from_browser)
        self._numbers = count(1)
        self._buffer = b""

    def close(self) -> None:
        self._process.kill()
        self._process.wait()
        os.close(self._in)
        os.close(self._out)

    def call(self, method: str, session: str | None = None, **parameters: Any) -> dict[str, Any]:
        """Calls a method of the protocol and returns its result."""
        number = next(self._numbers)
        message: dict[str, Any] = {"id": number, "method": method, "params": parameters}
        if session is not None:
            message["sessionId"] = session
        os.write(self._out, json.dumps(message).encode() + b"\0")
        while True:
            answer = self._receive()
            if answer.get("id") == number:
                assert "error" not in answer, answer["error"]
                return answer["result"]

    def _receive(self) -> dict[str, Any]:
        while b"\0" not in self._buffer:
            data = os.read(self._in, 1 << 20)
            assert data, "the browser went away"
            self._buffer += data
        message, _, self._buffer = self._buffer.partition(b"\0")
        return json.loads(message)

    def open(self, path: Path, anchor: str = "", *, width: int = 1280, height: int = 800, dark: bool = False) -> Page:
        """A page of its own with a file, loaded."""
        target = self.call("Target.createTarget", url="about:blank")["targetId"]
        session = self.call("Target.attachToTarget", targetId=target, flatten=True)["sessionId"]
        page = Page(self, session)
        page.call("Emulation.setDeviceMetricsOverride", width=width, height=height, deviceScaleFactor=1, mobile=False)
        scheme = {"name": "prefers-color-scheme", "value": "dark" if dark else "light"}
        page.call("Emulation.setEmulatedMedia", features=[scheme])
        page.call("Page.navigate", url=path.as_uri() + anchor)
        page.wait("document.readyState === 'complete' && location.href !== 'about:blank'")
        return page


class Page:
    """A page of the browser."""

    def __init__(self, browser: Browser, session: str) -> None:
        self._browser = browser
        self._session = session

    def call(self, method: str, **parameters: Any) -> dict[str, Any]:
        return self._browser.call(method, self._session, **parameters)

    def value(self, expression: str) -> Any:
        """The value of an expression in the page; a promise is waited for."""
        answer = self.call("Runtime.evaluate", expression=expression, returnByValue=True, awaitPromise=True)
        assert "exceptionDetails" not in answer, answer["exceptionDetails"]
        return answer["result"].get("value")

    def wait(self, expression: str, seconds: float = 30) -> None:
        """Waits until an expression holds."""
        end = time.monotonic() + seconds
        while not self.value(f"Boolean({expression})"):
            assert time.monotonic() < end, expression
            time.sleep(0.02)

    def press(self, key: str) -> None:
        code, number = _KEYS[key]
        text = {"/": "/", "Enter": "\r"}.get(key, "")
        event = {"key": key, "code": code, "windowsVirtualKeyCode": number}
        self.call("Input.dispatchKeyEvent", type="keyDown", text=text, **event)
        self.call("Input.dispatchKeyEvent", type="keyUp", **event)

    def type_text(self, text: str) -> None:
        for char in text:
            self.call("Input.dispatchKeyEvent", type="keyDown", text=char, key=char)
            self.call("Input.dispatchKeyEvent", type="keyUp", key=char)

    def click(self, element: str) -> None:
        """Clicks the middle of what an expression gives."""
        middle = "(e => { const r = e.getBoundingClientRect(); return [r.x + r.width / 2, r.y + r.height / 2] })"
        x, y = self.value(f"{middle}({element})")
        for kind in ("mouseMoved", "mousePressed", "mouseReleased"):
            self.call("Input.dispatchMouseEvent", type=kind, x=x, y=y, button="left", clickCount=1)

    def screenshot(self, path: Path) -> None:
        path.write_bytes(base64.b64decode(self.call("Page.captureScreenshot")["data"]))
