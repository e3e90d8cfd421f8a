"""Types that take types."""
from __future__ import annotations
import typing as t
from typing import (
    Annotated, Any, Callable, Concatenate, Final, Generic, Iterable, Literal, Mapping, NewType, Optional, ParamSpec,
    Protocol, Self, Sequence, Tuple, Type, TypeAlias, TypeVar, TypeVarTuple, Union, Unpack, cast,
)

T = TypeVar("T")
K = TypeVar("K", str, bytes)
V_co = TypeVar("V_co", covariant=True, bound="Base")
P = ParamSpec("P")
Ts = TypeVarTuple("Ts")
Id = NewType("Id", int)
Json: TypeAlias = "Union[str, int, None, list[Json], dict[str, Json]]"
Pairs = Sequence[Tuple[T, T]]
Handler = Callable[[int, str], "bool"]
LIMIT: Final = 10
MODE: Final[str] = "r"
CHOICE = Literal["a", 1, True, None, b"x", -1]


class Base:
    def same(self) -> Self: return self
    def __class_getitem__(cls, item): return cls


class Child(Base):
    child = 1


class Box(Generic[T]):
    value: T
    def __init__(self, value: T) -> None: self.value = value
    def map(self, f: Callable[[T], K]) -> Box[K]: return Box(f(self.value))
    def get(self) -> T: return self.value
    @classmethod
    def of(cls: type[Box[T]], value: T) -> Box[T]: return cls(value)


class IntBox(Box[int]):
    def twice(self): return self.value + self.get()


class Pair(Box[K], Mapping[K, T]):
    second: T
    def both(self) -> tuple[K, T]: return self.value, self.second


class Stack[S = int]:
    items: list[S]
    def push(self, item: S) -> Stack[S]: self.items.append(item); return self
    def pop(self): return self.items.pop()


class Reader(Protocol[V_co]):
    def read(self) -> V_co: ...


class Tree(t.Generic[T]):
    left: Optional[Tree[T]] = None
    def walk(self) -> Iterable[Tree[T]]:
        if self.left: yield from self.left.walk()
        yield self


def logged(f: Callable[P, T]) -> Callable[P, list[T]]:
    def inner(*args: P.args, **kwargs: P.kwargs) -> list[T]: return [f(*args, **kwargs)]
    return inner


def with_box(f: Callable[Concatenate[Box[T], P], T]) -> Callable[P, T]: ...
def first(items: Sequence[T], *more: T) -> T: return items[0]
def read(reader: Reader[T]) -> T: return reader.read()
def pack(*args: *Ts) -> tuple[int, *Ts]: return (1, *args)
def unpack(*args: Unpack[Ts], **rest: Unpack[dict]) -> Tuple[Unpack[Ts], str]: ...
def make(kind: Type[T], *args: Any) -> T: return kind(*args)
def key(k: K) -> K: return k
def either(flag: bool, a: T, b: K) -> T | K: return a if flag else b
def annotated(x: Annotated[int, "meta"], y: t.Optional["Child"], z: "t.List[int]", *, c: CHOICE = "a") -> Handler: ...
def no_hint(a, b=1, *c, d=None, e: ..., **f): return a or b or c or d or e or f


@logged
def join(a: int, b: str = "x") -> bool: return a == b
@with_box
def boxed(box: Box[str], n: int) -> str: return box.value


box = Box(1)
text_box = box.map(str)
text = text_box.get()
of = Box.of("x").value
int_box = IntBox(3).twice()
both = Pair("a").both()
popped = Stack[str]().push("x").pop()
plain = Stack().pop()
logged_join = join(1, b="y")
boxed_text = boxed(2)
first_text = first(["a"], "b")
packed = pack("a", 2.0)
made = make(Child).same().child
keyed = key("a"), key(b"b")
one = either(True, 1, "a")
identity = Id(5)
cast_child = cast(Child, one)
cast_text = cast("list[int]", one)
handler: Handler = lambda n, s: bool(n)
result = handler(1, "a")
table: Mapping[str, list[int]] = {"a": [1]}
item = table["a"][0]
nested: dict[str, dict[int, set[Box[Child]]]] = {}
deep = nested["a"][1]
for each in deep: deep_value = each.value.same()
opt: Optional[Child] = None
attr = opt.child
tree = Tree[int]()
walked = [node.left for node in tree.walk()]
alias: Pairs[int] = [(1, 2)]
(a, b), *rest = alias
json: Json = None
literal: CHOICE = "a"
