"""A small shop, for the first look at what quillet says of a source."""

from decimal import Decimal
import logging as log


class Basket:
    limit: int = 10

    def __init__(self, owner, items=None):
        self.owner = owner
        self.items = items or []  # type: list[Item]

    def total(self, *, rate=Decimal("0.19")):
        net = sum(item.price for item in self.items)
        if isinstance(rate, str):
            rate = Decimal(rate)
        return net * (1 + rate)

    def add(self, item, count=1)
        self.items.extend([item] * count)
        log.info("%s bought %d", self.owner, count)
