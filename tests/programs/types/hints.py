"""Hints in all their spellings, and what calls make of them."""
import typing
from typing import (
    Any, Callable, ClassVar, Dict, Generic, List, Literal, LiteralString, NoReturn, Never, Optional, Protocol, ReadOnly,
    Set, Tuple, Type, TypedDict, TypeVar, Union, overload,
)
from dataclasses import dataclass
from types import FunctionType, MethodType, ModuleType, NoneType

T = TypeVar("T")
S = TypeVar("S")
R = TypeVar("R", bound="Animal")
type Tree[T] = T | list[Tree[T]]
type Pair[A, B] = tuple[A, B]
Swapped = Tuple[S, T]
OptionalList = Optional[List[T]]


class Animal:
    legs = 4
    def meet(self: R, other: R) -> R: return other
class Dog(Animal):
    def bark(self) -> str: return "wau"


def bare(a: LiteralString, b: Tuple, c: Type, d: Callable, e: List, f: Dict, g: Literal, h: Optional, i: Union): return a, b, c, d, e, f, g, h, i
def nothing(a: Never, b: None, c: NoneType, d: "", e: (int, str), f: [int], g: 1, h: "int | 'str'", i: not_there): return a, b, c, d, e, f, g, h, i
def pair(p: Tuple[T, S]) -> Tuple[S, T]: return p[1], p[0]
def any_tuple(p: Tuple[T, ...]) -> T: return p[0]
def apply(f: Callable[[T], S], x: T) -> S: return f(x)
def compose(f: Callable[[T], S], g: Callable[[S], R]) -> Callable[[T], R]: return lambda x: g(f(x))
def call_any(f: Callable[..., T]) -> T: return f()
def make(cls: Type[R], *args) -> R: return cls(*args)
def keys(d: Dict[T, S]) -> List[T]: return list(d)
def maybe(x: Optional[T]) -> T: return x
def union(x: Union[T, List[T]]) -> T: return x
def as_swapped(x: Swapped[int, str]) -> Pair[str, "int"]: return x
def tree(t: Tree[int]) -> Tree[str]: return str(t)
def option(x: OptionalList[int]): return x[0]
def given(x: int) -> str: return str(x)
def dog(x: str) -> Dog: return Dog()
def literal(m: Literal["a", "b"] = "a", n: Literal[1] = 1) -> NoReturn: raise SystemExit


@overload
def over(x: None) -> None: ...
@overload
def over(x: Type[Animal]) -> Animal: ...
@overload
def over(x: Tuple[int, str]) -> int: ...
@overload
def over(x: Callable[[], Any]) -> str: ...
@overload
def over(x: Literal["a"]) -> bytes: ...
@overload
def over(x: List[Dog], y: int = 1) -> Dog: ...
@overload
def over(x: Any, *rest: int) -> float: ...
def over(x, *rest): return x


@dataclass
class Box(Generic[T]):
    item: T
    others: "List[T]" = ()
    shared: ClassVar[int] = 1
    def map(self, f: Callable[[T], S]) -> "Box[S]": return Box(f(self.item))
@dataclass
class Labelled(Box[T]):
    label: str = ""
class Sized(Protocol):
    def __len__(self) -> int: ...
class Read(TypedDict):
    a: ReadOnly[int]
    nested: "Inner"
class Inner(TypedDict, total=False): deep: List[Dog]
class Handler(Protocol[T]):
    def __call__(self, item: T, /, *, flag: bool = ...) -> List[T]: ...


swapped = pair((1, "a"))
one = any_tuple((1, 2)), apply(given, 1), apply(lambda x: [x], 1), apply(Dog, 1).bark(), apply(str.upper, "a")
composed = compose(given, dog)(1).bark()
called = call_any(lambda: 3), call_any(Dog).legs, make(Dog).meet(Dog()), keys({"a": 1}), maybe(None), maybe(1)
united = union([1]), union(1), as_swapped(1)[0], tree(1), option([1]), given, literal
overs = over(None), over(Dog), over((1, "a")), over(given), over("a"), over([Dog()]), over([Dog()], 2), over(1, 2, 3), over(x=3), over(*one), over(unknown)
boxed = Box(Dog()).item.bark(), Box(item=1).map(given).item, Labelled("x", label="y").item, Labelled(*one), Box[int](1).others, Box.shared
record: Read = {"a": 1, "nested": {"deep": [Dog()]}}
deep = record["nested"]["deep"][0].bark(), record.get("a"), record.copy()["a"], [k for k in record]
def takes(r: Read, *, more: "Inner" = None): return r["a"], more["deep"]
takes({"a": 2, "nested": {"deep": []}}, more={"deep": [Dog()]})
handler: Handler[int] = given
handled = handler(1, flag=True)
functions: List[Callable[[int], Dog]] = []
function_attributes = given.__name__, given.__doc__, Dog().bark.__func__, typing.__name__, typing.shown(), Dog.__name__
kinds: "FunctionType | MethodType | ModuleType" = given
for function in functions: function(1).bark()
alias_call = typing.cast("Dog", None).bark(), typing.cast(typing.List[Dog], [])[0].legs, typing.cast(Tree[int], 1)
Vector = list[float]
Matrix = "list[Vector]"
m: Matrix = []
row = m[0][0], m[0:1], m[0][::2]
