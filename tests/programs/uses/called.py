# What calls give, and what they hand over.
import functools
from functools import cached_property, partial, wraps
from typing import (Any, Callable, Dict, Generic, Iterable, Iterator, List, Literal, Optional, ParamSpec, Protocol, Sequence,
                    Tuple, Type, TypeVar, Union, cast, overload)

T = TypeVar("T")
S = TypeVar("S", bound="Shape")
N = TypeVar("N", int, str)
P = ParamSpec("P")


class Shape:
    def grown(self: S, by: int = 1) -> S:
        return self

    def __call__(self, x: int) -> str:
        return str(x)

    def __enter__(self):
        return self

    def __exit__(self, *args):
        return None

    def __getitem__(self, key: int) -> "Shape":
        return self

    def __iter__(self) -> Iterator["Shape"]:
        yield self

    def __add__(self, other: "Shape") -> "Shape":
        return other

    def __neg__(self) -> float:
        return 1.0

    def __contains__(self, x):
        return True

    def __len__(self):
        return 1

    def __bool__(self):
        return True


class Round(Shape):
    radius = 1.0

    def grown(self, by=1):
        return super().grown(by)


@overload
def chosen(x: int) -> str: ...
@overload
def chosen(x: str, *, loud: bool = ...) -> bytes: ...
@overload
def chosen(x: Literal["a"], y: int) -> float: ...
@overload
def chosen(x: None) -> None: ...
@overload
def chosen(x: Tuple[int, str]) -> int: ...
@overload
def chosen(x: Callable[[int], str]) -> complex: ...
@overload
def chosen(x: Type[Shape]) -> Shape: ...
def chosen(x, y=None, *, loud=False):
    return x


chosen(1).upper
chosen("b").decode
chosen("b", loud=True).decode
chosen("a", 1).is_integer
chosen(None)
chosen((1, "a")).real
chosen(lambda x: "").real
chosen(Shape()).real
chosen(Round).grown
chosen(x=1).upper
chosen(*[1])
chosen(**{"x": 1})
chosen()


def same(x: T) -> T:
    return x


def first(xs: Sequence[T]) -> T:
    return xs[0]


def either(a: T, b: T) -> T:
    return a


def optional(x: Optional[T]) -> T:
    return x


def many(*xs: T) -> List[T]:
    return list(xs)


def keyed(**xs: T) -> Dict[str, T]:
    return xs


def applied(f: Callable[[int], T], x: int = 0) -> T:
    return f(x)


def paired(f: Callable[..., T], g: Union[int, str] = 1) -> Tuple[T, T]:
    return f(), f()


def instance(cls: Type[T]) -> T:
    return cls()


def classes(x: T) -> Type[T]:
    return type(x)


def decorator(f: Callable[P, T]) -> Callable[P, List[T]]:
    @wraps(f)
    def inner(*args: P.args, **kwargs: P.kwargs) -> List[T]:
        return [f(*args, **kwargs)]

    return inner


def limited(x: N) -> N:
    return x


def bound(x: S) -> S:
    return x


same(1).real
same(Shape()).grown().grown(2)
first([Shape()]).grown()
first("a").upper
first((1, "a"))
either(1, "a")
optional(Shape()).grown()
many(1, 2)[0].real
keyed(a=Shape())["a"].grown()
applied(str).upper
applied(lambda x: Shape()).grown()
applied(Shape()).upper
paired(Shape)[1].grown()
instance(Shape).grown()
instance(Round).grown().radius
classes(Shape())().grown()
limited("").upper
bound(Round()).radius


@decorator
def listed(x: int) -> Shape:
    return Shape()


listed(1)[0].grown()
Round().grown().radius
Round()(1).upper
Round()[0].grown()
(Shape() + Round()).radius
(-Shape()).is_integer
for shape in Shape():
    shape.grown()
with Round() as rounded, Shape():
    rounded.radius


class Sized(Protocol):
    def size(self, unit: str) -> int: ...


class Making(Protocol[T]):
    def make(self, x: int, *, y: str = "") -> T: ...


class Maker:
    def make(self, x, *, y=""):
        return Shape()

    def size(self, unit):
        return 1


def made_by(x: Making[T]) -> T:
    return x.make(1)


def sized(x: Sized) -> int:
    return x.size("")


made_by(Maker()).grown()
sized(Maker()).real

halved = partial(same, 1)
halved().real
cast(Shape, nothing).grown()
cast("Shape", nothing).grown()
functools.partial(Shape)().grown()


class Lazy:
    @cached_property
    def shape(self):
        return Shape()

    @functools.lru_cache(maxsize=None)
    def cached(self):
        return Shape()

    made = staticmethod(Shape)
    also = classmethod(lambda cls: cls())

    def chained(self):
        return self

    def returning(self, x=None):
        if x is None:
            return 1
        if x:
            return ""
        return [self]

    def recursive(self, n):
        if n == 0:
            return Shape()
        return self.recursive(n - 1)


Lazy().shape.grown()
Lazy().cached().grown()
Lazy().made().grown()
Lazy().also().shape
Lazy().chained().chained().shape
Lazy().returning()
Lazy().recursive(1).grown()
Lazy.chained(Lazy()).shape
getattr(Lazy(), "shape").grown()
getattr(Lazy(), "missing", Shape()).grown()
type(Lazy()).also
type(Shape())().grown()
isinstance(Shape(), Lazy).real
max(Shape(), Round()).grown()
sorted([Shape()])[0].grown()
sum([1, 2]).real
next(iter([Shape()])).grown()
next(iter([Shape()]), None).grown()
list(map(lambda x: Shape(), [1]))[0].grown()
list(reversed([Shape()]))[0].grown()
dict(zip(["a"], [Shape()]))["a"].grown()
[x for x in [Shape()] if x][0].grown()
(x for x in [Shape()])
{x: 1 for x in [Shape()]}
(lambda a, b=Shape(): b)(1).grown()
(Shape() if halved else Round()).grown()
(Shape() and 1).real
(None or Shape()).grown()
(walrus := Shape()).grown()
walrus.grown()
not Shape()
Shape() in [1]
"%s" % 1
"a" * 2
[1] * 2
f"{Shape().grown()}".upper
1 + 1.0
1 / 2
-1
2**3


def handed(a, b=None, *c, d, e=Round(), **f):
    a.grown()
    b.radius
    c[0].grown()
    d.upper
    e.radius
    f["g"].grown()
    return a


handed(Shape(), Round(), Shape(), d="", g=Shape()).grown()


def given(callback):
    callback(Shape())


def called_back(shape):
    shape.grown()


given(called_back)
given(lambda shape: shape.grown())


from typing import Counter, Deque, Text


def generic_alias(
    a: List[int],
    b: Dict[str, Shape],
    c: "Iterable[Round]",
    d: Any,
    e: Type["Shape"],
    f: Counter[str],
    g: Deque[Round],
    h: Text,
):
    a[0].real
    b["a"].grown()
    for x in c:
        x.radius
    d.anything
    e().grown()
    f["a"].real
    f.total().real
    g.popleft().radius
    h.upper
