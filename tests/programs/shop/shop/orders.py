"""Orders, with cycles of imports and generators."""
from typing import TYPE_CHECKING, Generator, Iterable, Tuple, TypeVar, overload

import shop
import shop.goods as stock
from shop.goods import Good, TAX as tax_rate

if TYPE_CHECKING:
    from .customers import Customer

T = TypeVar("T")
N = TypeVar("N", int, float)
B = TypeVar("B", bound="Order")


class Order:
    goods: "list[Good]"
    customer = None  # type: Customer

    def __init__(self, customer: "Customer", goods: Iterable[Good] = ()):
        self.customer = customer
        self.goods = list(goods)
        self.notes = {}
        self.paid, (self.day, *self.rest) = False, (1, 2, 3)

    def __len__(self):
        return len(self.goods)

    def __iter__(self):
        for good in self.goods:
            yield good

    def add(self: B, good: Good, /, *, note: str = "") -> B:
        self.goods.append(good)
        self.notes[good] = note
        return self

    def priced(self) -> Generator[Tuple[Good, int], None, str]:
        for i, good in enumerate(self.goods):
            got = yield good, i
            print(got)
        return "done"

    @overload
    def find(self, key: int) -> Good: ...
    @overload
    def find(self, key: str) -> "Good | None": ...
    def find(self, key):
        if type(key) is int:
            return self.goods[key]
        for good in self.goods:
            if good.name == key:
                break
        else:
            good = None
        return good


def first_of(items: Iterable[T], default: T = None) -> T:
    for item in items:
        return item
    return default


def twice(number: N) -> N:
    return number * 2


def total_of(order: Order, tax: float = tax_rate, *rest, discount=None, **more) -> float:
    """Everything together.

    Args:
        order: whose goods are added
        tax (float): a share
        discount: taken off, or None

    Returns:
        float: in cents
    """
    total = 0
    for good in order:
        total += good.price
    if discount is not None:
        total -= discount
    return total * (1 + tax)


def empty(customer: "Customer"):
    order = Order(customer)
    order.add(stock.first).add(stock.second, note="soon")
    best = first_of(order.goods)
    number = twice(3), twice(1.5)
    one, text = order.find(0), order.find("x")
    result = yield from order.priced()
    shown = shop.total_of(order, discount=1)
    return best, number, one, text, result, shown
