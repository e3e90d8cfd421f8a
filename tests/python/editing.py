"""What the tests of editors edit: the texts of two files, and where the document of their set-up is."""

from __future__ import annotations

from pathlib import Path

EDITORS = Path(__file__).resolve().parent.parent.parent / "docs" / "editors.md"

SHOP = """\
class Shop:
    def total(self, tax=0):
        return tax


def pay(shop: Shop):
    return shop.total(1)
"""
MAIN = """\
from shop import Shop, pay

corner = Shop()
pay(corner)
corner.total()
"""
