# Goods, by inheritance, properties and class methods.
from __future__ import annotations

import sys
from abc import ABC, abstractmethod
from dataclasses import dataclass, field
from functools import cached_property
from typing import ClassVar, Dict, Iterator, List, Optional, Union

from .errors import OutOfStock

__all__ = ("Good", "Book", "Cup", "Priced", "TAX")

TAX: float = 0.19
_cache = {}  # type: Dict[str, Good]
numbers = 1, 2.5, 3j, "four", b"five", None, True, ...


class Priced(ABC):
    """Has a price.

    Attributes:
        price: in cents
        currency (str): three letters
    """

    currency = "EUR"

    @property
    @abstractmethod
    def price(self) -> int: ...

    @classmethod
    def make(cls, *args, **kwargs):
        made = cls(*args, **kwargs)
        _cache[repr(made)] = made
        return made

    @staticmethod
    def rounded(value: float, digits: int = 2) -> float:
        return value + digits

    def __lt__(self, other: Priced) -> bool:
        return self.price < other.price


class Good(Priced):
    count: ClassVar[int] = 0
    __slots__ = ("name", "_price", "__left")

    def __init__(self, name: str, price: int = 0, left: int = 0) -> None:
        self.name = name
        self._price = price
        self.__left = left
        Good.count += 1

    @property
    def price(self) -> int:
        """What one costs."""
        return self._price

    @price.setter
    def price(self, price: int) -> None:
        self._price = price

    @price.deleter
    def price(self):
        del self._price

    @cached_property
    def words(self):
        return self.name.split()

    def take(self, count=1):
        """Takes some.

        :param count: how many
        :type count: int
        :returns: what is left
        :rtype: int
        """
        if self.__left < count:
            raise OutOfStock(self.name, count, code=2)
        self.__left -= count
        return self.__left

    def __add__(self, other: Union[Good, int]) -> int:
        if isinstance(other, Good):
            return self.price + other.price
        return self.price + other

    def __radd__(self, other: int) -> int:
        return self + other

    def __iter__(self) -> Iterator[str]:
        yield from self.words
        yield self.name

    def __enter__(self):
        return self

    def __exit__(self, *args):
        return None

    def __call__(self, factor: float) -> float:
        return self.price * factor

    def __getitem__(self, key: slice | int) -> str:
        return self.name[key]

    def __contains__(self, word):
        return word in self.words


class Book(Good):
    pages = 0

    def __init__(self, name, pages, **rest):
        super().__init__(name, **rest)
        self.pages = pages
        self.author = self.translator = None  # type: Optional[str]

    def take(self, count=1):
        left = super().take(count)
        return left if left else None

    @property
    def price(self):
        return super().price * 2


@dataclass
class Cup:
    colour: str
    size: int = 3
    marks: List[str] = field(default_factory=list)
    inner: "Cup | None" = None

    def bigger(self, by: int = 1) -> "Cup":
        return Cup(self.colour, self.size + by, marks=self.marks)


if sys.version_info >= (3, 12):
    from typing import Self as _Self
elif sys.platform == "win32":
    _Self = int
else:
    _Self = None

first = Good("first", price=3)
second = Book.make("second", 200)
sum_of_both = first + second
other_sum = 1 + first
product = first(1.5)
letter = first[0]
with first as again, Book("third", 3) as third:
    words = [word.upper() for word in again if word]
    lengths = {word: len(word) for word in third.words}
cup = Cup("red").bigger(by=2)
marks = cup.marks
inner = cup.inner.colour if cup.inner else cup.colour
del product
