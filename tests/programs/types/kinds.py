"""Classes that make attributes of their own."""
import enum
import collections
from dataclasses import dataclass, field, replace
from typing import NamedTuple, Required, NotRequired, TypedDict, overload
from missing import UnknownBase, unknown_decorator, Meta as UnknownMeta


class Descriptor:
    @overload
    def __get__(self, obj: None, owner: type) -> "Descriptor": ...
    @overload
    def __get__(self, obj: object, owner: type) -> int: ...
    def __get__(self, obj, owner=None): return self if obj is None else 3
    def __set__(self, obj, value: int): pass
    def __set_name__(self, owner, name): self.name = name


class Meta(type):
    registry = []
    def __call__(cls, *args): return super().__call__(*args)
    def __iter__(cls): return iter([cls()])
    def __len__(cls) -> int: return 3
    @property
    def shown(cls): return cls.__name__


class Made(metaclass=Meta):
    managed = Descriptor()
    def __new__(cls, value=0):
        self = object.__new__(cls)
        self.value = value
        return self
    def __getattr__(self, name: str) -> float: return 1.5
    def __eq__(self, other): return True
    def __bool__(self): return False
    def __hash__(self): return 1


class Left(Made): common = 1
class Right(Made): common = "right"
class Both(Left, Right): own = None
class Unknown(UnknownBase, Left): known = 1
class Odd(metaclass=UnknownMeta): odd = 1
class Broken(Left, object, Left): x = 1
class Circle(Circle): pass
class Mixed(object, Left): pass
def bases(): return Left
class Computed(bases(), *[Right], key=1, **{}): pass
class Callable_(Left):
    def __call__(self, x: int) -> str: ...


@dataclass(order=True, frozen=True)
class Point:
    x: int
    y: int = 0
    tags: list = field(default_factory=list, compare=False)
    def __post_init__(self): self.extra = self.x


@dataclass
class Point3(Point):
    z: float = 1.0


@unknown_decorator
class Decorated(Point): w = 1
@unknown_decorator(1)
def decorated(a): return a


class Colour(enum.Enum):
    RED = 1
    GREEN = "g"
    _ignore_ = ["x"]
    def __init__(self, code): self.code = code
    @classmethod
    def default(cls): return cls.RED


class Perm(enum.Flag):
    R = enum.auto()
    W = enum.auto()
    RW = R | W


class Movie(TypedDict):
    title: Required[str]
    year: NotRequired[int]


Other = TypedDict("Other", {"a": int, "b": "str"})
Old = NamedTuple("Old", [("a", int), ("b", str)])
Loose = collections.namedtuple("Loose", "a, b c", defaults=(1,))
Fun = enum.Enum("Fun", "A B C")
Typed = type("Typed", (Left,), {"z": 1})

made = Made(3)
int_value = made.managed
descriptor = Made.managed
dynamic = made.whatever
from_meta = Made.shown, len(Made), [m for m in Made]
common = Both().common
unknown = Unknown().known, Unknown().anything
mro = Both.__mro__, Both.mro(), Both.__name__, made.__class__, made.__dict__, Made.__doc__
p3 = Point3(1, 2, [], 3.0)
coordinates = p3.x, p3.z, p3.extra, replace(p3, x=2)
red = Colour.RED.value, Colour["GREEN"], Colour(1).name, Colour.default().code, Perm.R | Perm.W
movie: Movie = {"title": "x"}
title, year = movie["title"], movie.get("year")
old = Old(1, "a").b, Loose(1, 2).c, Fun.A, Typed().z
called = Callable_()(1)
odd = Odd.odd, Computed().common, Broken().x, Circle, decorated(1)
made.value.more = made.other = 1
