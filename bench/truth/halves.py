"""Which half of a truth set a case is in.

Half of each set is worked with; the other is kept for a last look that nothing was fitted to. A case's key says which:
so nobody chooses, and a runner can leave the other half unread.
"""

from __future__ import annotations

import argparse
import hashlib


def InHalf(key: str, half: str) -> bool:
    """Whether the SHA-256 of the key ends in an even byte ("even") or an odd one ("odd")."""
    odd = hashlib.sha256(key.encode()).digest()[-1] % 2
    return odd == (half == "odd")


def AddHalf(parser: argparse.ArgumentParser) -> None:
    parser.add_argument("--half", choices=("even", "odd"), default="even", help="the keys that are used (even)")
