"""The vocabulary of records: constants, composing info strings, reading them back.

An info string is the second half of a record, as bytes: a bare prefix, a prefix with a detail behind it,
or the source text of an equivalent expression. `DecodeInfo` takes any of them apart.
"""

from __future__ import annotations

from typing import Any

from quillet._string_values import ObjectForStringLiteral as ObjectForStringLiteral
from quillet.tarvex import _siblings

globals().update({name: value for name, value in vars(_siblings.symbolinfo).items() if not name.startswith("__")})


class CLocationCache:
    """Keeps the location of the builtins, which is worked out when it is first asked for.

    A subclass says what that location is by overriding `_LoadBuiltinLoc`.
    """

    def __init__(self) -> None:
        self._fBuiltinLoc: Any = None

    def GetBuiltinLoc(self) -> Any:
        """The location of the builtins, loaded unless it is known."""
        if self._fBuiltinLoc is None:
            self._LoadBuiltinLoc()
        return self._fBuiltinLoc

    def _LoadBuiltinLoc(self) -> None:
        """Sets `_fBuiltinLoc`: here, to the info string of the host's module of builtins."""
        self._fBuiltinLoc = _siblings.symbolinfo.kBuiltinModulePrefix + b"builtins"
