# Classes made in other ways than by a plain statement, and what they have.
import collections
import enum
import typing
from collections import namedtuple
from dataclasses import dataclass, field
from typing import Generic, NamedTuple, TypedDict, TypeVar

from six import add_metaclass, with_metaclass

T = TypeVar("T")


class Meta(type):
    kind = "meta"

    def made(cls):
        return cls()

    def __getitem__(cls, key):
        return key

    def __iter__(cls):
        yield cls()

    def __len__(cls):
        return 0


class Base:
    def based(self):
        return self


class Six(with_metaclass(Meta, Base)):
    own = 1


class Added(metaclass=Meta):
    def __init_subclass__(cls, **options):
        cls.options = options


class Below(Added, option=1):
    pass


Six.kind
Six.made().own
Six().based().own
Six["a"].upper
Below.kind
Below.options
Below().options
for one in Below:
    one.options


class Slots:
    __slots__ = ("a", "b")

    def use(self):
        self.a
        self.c


class OneSlot:
    __slots__ = "only"


class ListedSlots(Slots):
    __slots__ = ["c", "d"]

    def __init__(self):
        self.c = Base()

    def use(self):
        self.c.based()
        self.d


class DocumentedSlots:
    __slots__ = {"documented": "What it is.", "other": ""}


class OddSlots:
    __slots__ = made_elsewhere


OneSlot().only
ListedSlots().a
DocumentedSlots().documented
DocumentedSlots().other
OddSlots().anything

Point = namedtuple("Point", "x y")
Spaced = collections.namedtuple("Spaced", "a, b,c", defaults=(1,))
Listed = namedtuple("Listed", ["p", "q"])
Tupled = namedtuple(typename="Tupled", field_names=("m", "n"))
Typed = NamedTuple("Typed", [("name", str), ("size", int)])
Dict = TypedDict("Dict", {"name": str, "size": int})
Total = TypedDict("Total", {"name": str}, total=False)
Keys = typing.TypedDict("Keys", fields={"inner": Dict})
Made = type("Made", (Base,), {"a": 1})
Other = type("Other", (), dict(b=2))
Colour = enum.Enum("Colour", "RED GREEN")
Size = enum.Enum("Size", ["S", "M"])
Weight = enum.IntEnum("Weight", {"LIGHT": 1, "HEAVY": 2})

Point(1, 2).x
Point(x=1, y="")._asdict()
Point(1, 2)[1]
Spaced(1, 2).c
Listed(1, 2).q
Tupled(1, 2).m
Typed("", 1).name.upper
Typed("", 1)[1].real
a_dict: Dict = {"name": "", "size": 1}
a_dict["name"].upper
a_dict["size"].real
a_total = Total(name="")
a_total["name"].upper
a_keys: Keys = {"inner": {"name": "", "size": 1}}
a_keys["inner"]["name"].upper
Made().based().a
Made.a
Other().b
Colour.RED.name
Size.M.value
Weight.HEAVY.real
Weight["LIGHT"].value


class Person(NamedTuple):
    name: str
    age: int = 0

    def older(self):
        return self.age + 1


Person("a").name.upper
Person(name="a").older().real
name, age = Person("a", 1)
name.upper
age.real


@dataclass
class Order:
    number: int
    lines: list[Person] = field(default_factory=list)
    note: str = ""

    def first(self):
        return self.lines[0]


@dataclass(frozen=True)
class Special(Order):
    price: float = 0.0


Special(1, [], "", 2.0).first().name.upper
Special(number=1, price=1.0).price.is_integer
Special(1).lines[0].older


class Direction(enum.Enum):
    NORTH = 1
    SOUTH = "s"
    WEST = EAST = enum.auto()

    @property
    def opposite(self):
        return Direction.SOUTH

    def turned(self):
        return self.NORTH


Direction.NORTH.opposite.turned().value
Direction("s").name
Direction["WEST"].opposite
for direction in Direction:
    direction.opposite


class Pair(Generic[T]):
    def __init__(self, left: T, right: T):
        self.left = left
        self.right = right

    def swapped(self) -> "Pair[T]":
        return Pair(self.right, self.left)


class Both(Pair[Base]):
    pass


class Tuple(tuple[int, str]):
    def first(self):
        return self[0]


Pair(1, 2).swapped().left.real
Both(Base(), Base()).swapped().right.based()
Tuple().first().real
Tuple()[1].upper


class Unknown(from_nowhere, Base):
    def use(self):
        self.based()
        self.anything
        super().based()


class Starred(*bases, **options):
    own = 1


Starred().own
Starred().other


def decorated(cls):
    cls.added = 1
    return cls


@decorated
class Decorated:
    own = 2


@add_metaclass(Meta)
class AddedMeta:
    own = 3


Decorated().own
Decorated().added
AddedMeta.own


class Private:
    __hidden = 1
    _Private__spelled = 2

    def use(self):
        self.__hidden
        self._Private__hidden
        self.__spelled
        self.__own = ""
        return self.__own.upper


class Getting:
    def __getattr__(self, name):
        return Base()

    def __setattr__(self, name, value):
        pass


class Described:
    def __get__(self, instance, owner):
        return Base()

    def __set__(self, instance, value):
        pass


class Describing:
    described = Described()
    partly = property(lambda self: Base())

    @property
    def whole(self):
        return Base()

    @whole.setter
    def whole(self, value):
        value

    @staticmethod
    def still(x=1):
        return x

    @classmethod
    def of(cls, x=""):
        return cls()


Getting().anything.based()
Describing().described.based()
Describing().partly.based()
Describing().whole.based()
Describing.still().real
Describing.of().whole.based()
Describing().of
