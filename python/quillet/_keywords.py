"""The words that are no names, by version of Python.

The lists are those of the language, not of the interpreter that runs: a source is analysed as its own
version reads it. "print" and "exec" are keywords in 2 alone; "None", "True" and "False" in 3 alone;
"async" and "await" from 3.7 on.
"""

from __future__ import annotations

_BOTH = (
    "and as assert break class continue def del elif else except finally for from global if import in is lambda "
    "not or pass raise return try while with yield"
).split()
_PYTHON_2 = ("exec", "print")
_PYTHON_3 = ("False", "None", "True", "nonlocal")
_SINCE_3_7 = ("async", "await")


def keywords_of(version: tuple[int, int], *, print_function: bool = False) -> tuple[str, ...]:
    """The keywords of a version, sorted; "print" is none where 2.7 has the print function on."""
    words = list(_BOTH)
    if version < (3, 0):
        words += (word for word in _PYTHON_2 if not (print_function and word == "print"))
    else:
        words += _PYTHON_3
        if version >= (3, 7):
            words += _SINCE_3_7
    return tuple(sorted(words))
