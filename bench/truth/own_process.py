"""A workspace in a process of its own that answers line by line, so that times and memory are those of nothing else.

Each line of the input is JSON: calls, each a method of the workspace and its arguments. Each line of the output says
how many seconds of the processor they took here, and how many results each had.
"""

from __future__ import annotations

import json
import sys
import time
from typing import Any

import quillet


def Main() -> None:
    workspace: Any = quillet.Workspace(*sys.argv[1:])
    for line in sys.stdin:
        calls = json.loads(line)
        start = time.process_time()
        results = [getattr(workspace, method)(*given) for method, *given in calls]
        seconds = time.process_time() - start
        print(
            json.dumps([seconds, [len(result) if hasattr(result, "__len__") else 0 for result in results]]), flush=True
        )


if __name__ == "__main__":
    Main()
