from enum import Enum, IntEnum, auto
from typing import Literal, NamedTuple, Protocol, TypedDict
from collections import namedtuple, defaultdict, deque

from . import orders
from .orders import Order, first_of
from ..shop.errors import ShopError
from .missing import nothing
import unknown.module

Point = namedtuple("Point", "x y")
Pair = namedtuple("Pair", ["left", "right"])


class Address(NamedTuple):
    street: str
    number: int = 1

    def shown(self):
        return f"{self.street} {self.number!r:>{self.number}}"


class Level(Enum):
    GUEST = 1
    MEMBER = "member"
    BOTH = auto()

    @property
    def is_known(self):
        return self is not Level.GUEST


class Size(IntEnum):
    SMALL = 1
    LARGE = 2


class Settings(TypedDict, total=False):
    colour: str
    level: Level


class Named(Protocol):
    name: str

    def greet(self, other: "Named") -> str: ...


class Customer(Named):
    level: Level = Level.GUEST

    def __init__(self, name, address=None, **settings):
        self.name = name
        self.address: Address | None = address
        self.orders: "list[orders.Order]" = []
        self.by_day = defaultdict(list)
        self.recent = deque()
        self.settings: Settings = {"colour": "red", "level": Level.MEMBER}

    def greet(self, other):
        """Says hello.

        Parameters
        ----------
        other : Customer
            who is greeted
        """
        return "hello " + other.name

    def order(self, *goods):
        made = Order(self, goods)
        self.orders.append(made)
        return made

    def where(self):
        if not self.address:
            return None
        street, number = self.address
        return self.address.street, street, number

    def describe(self, mode: Literal["long", "short"] = "short"):
        if mode == "long":
            return self.where()
        elif mode in ("short",):
            return self.name
        assert False, mode


point = Point(1, y=2)
x = point.x
pair = Pair(*point)
anna = Customer("Anna", Address("Main", number=3))
level = anna.level.value
member = Level["MEMBER"].name
levels = [each.is_known for each in Level]
colour = anna.settings["colour"]
street = anna.where()
order = anna.order()
got = first_of(order)
size = Size.SMALL + 1
try:
    anna.greet(nothing)
except (ShopError, OSError) as problem:
    code = problem.args
except* ValueError as group:
    several = group.exceptions
