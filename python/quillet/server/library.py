"""lsprotocol and pygls, loaded where a message needs them: they say what messages must hold."""

from __future__ import annotations

from typing import Any

from lsprotocol import types
from pygls.protocol import default_converter

_converter = default_converter()  # type: ignore[no-untyped-call]


def read_params(method: str, params: Any) -> Any:
    """The parameters of a message as lsprotocol has them. Raises an exception of cattrs' for wrong ones."""
    kinds = types.METHOD_TO_TYPES.get(method)
    if kinds is None or kinds[0] is None:
        return params
    message = {"jsonrpc": "2.0", "id": 0, "method": method, "params": params}
    return _converter.structure(message, kinds[0]).params
