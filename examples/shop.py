from decimal import Decimal

class Basket:
    limit: int = 10

    def __init__(self, owner, items=None):
        self.items = items or []  # type: list[Item]

    def add(self, item, count=1)
        self.items.extend([item] * count)
