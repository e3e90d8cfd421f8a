"""Where the installation keeps its resources."""

from __future__ import annotations

import os

__all__ = ["GetNorvaFilename"]

_PACKAGE_DIR = os.path.dirname(os.path.abspath(__file__))


def GetNorvaFilename(relative_name: str) -> str:
    """The absolute path of a resource of the installation, such as "resources/pgen-grammars/Python-Grammar-3.8".

    The file need not exist.
    """
    return os.path.join(_PACKAGE_DIR, *relative_name.split("/"))
