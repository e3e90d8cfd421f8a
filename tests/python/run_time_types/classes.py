import abc
import enum
import functools
import types
from dataclasses import dataclass, field, replace
from collections import namedtuple
from typing import NamedTuple, Generic, TypeVar, Optional, ClassVar, Protocol


class Base:
    shared = "s"
    _instances = []

    def __init__(self, name):
        self.name = name
        self.other = None
        self.children = []
        self.by_name = {}
        Base._instances.append(self)

    def clone(self):
        return self.__class__(self.name)

    def clone2(self):
        return type(self)(self.name)

    @classmethod
    def make(cls):
        return cls("x")

    @staticmethod
    def helper(v):
        return v

    @property
    def prop(self):
        return self.children

    @functools.cached_property
    def cached(self):
        return 3.5

    def add(self, child):
        self.children.append(child)
        self.by_name[child.name] = child
        return self

    def __enter__(self):
        return self

    def __exit__(self, *args):
        return False

    def __iter__(self):
        return iter(self.children)

    def __len__(self):
        return len(self.children)

    def __getitem__(self, i):
        return self.children[i]  # unknown

    def __call__(self, v):
        return [v]  # unknown

    def __add__(self, other):
        return Base(self.name + other.name)  # unknown

    def __eq__(self, other):
        return self is other  # unknown

    def __hash__(self):
        return 1

    def __contains__(self, v):
        return True

    def __bool__(self):
        return True


class Derived(Base):
    def __init__(self, name):
        super().__init__(name)
        self.extra = 1

    def clone(self):
        c = super().clone()
        return c

    @property
    def prop(self):
        return super().prop + [1]


class Old(Base):
    def __init__(self):
        super(Old, self).__init__("old")
        Base.__init__(self, "old")


b = Base("b")
dv = Derived("d")
v1 = b.clone()
v2 = dv.clone()
v3 = dv.clone2()
v4 = Derived.make()
v5 = Base.helper(3)
v6 = b.helper("s")
v7 = b.prop
v8 = dv.cached
v9 = b.add(dv).add(Derived("e"))
v10 = b[0]
v11 = b(3)
v12 = b + dv
v13 = len(b)
v14 = dv in b
v15 = b == dv
v16 = not b
print(v1, v2, v3, v4, v5, v6, v7, v8, v9, v10, v11, v12, v13, v14, v15, v16)
with Base("w") as w:
    w.name
with Derived("w") as w2, Base("q") as w3:
    w2.extra
    w3.name
for ch in b:
    ch.name
b.by_name["d"].name
b.by_name.get("d").name
v9.children[0].extra
Base._instances[0].name  # unknown
b.__class__
b.__class__.__name__
b.__dict__
Derived.__mro__
Derived.__bases__
b.shared
Base.shared
b.other
b.other = Derived("o")


class Color(enum.Enum):
    RED = 1
    GREEN = "g"

    @property
    def nice(self):
        return self.name.lower()

    @classmethod
    def default(cls):
        return cls.RED

    def describe(self):
        return self.name, self.value

    @types.DynamicClassAttribute
    def code(self):
        return len(self.name)


Color.RED
Color.RED.name
Color.RED.value
Color.GREEN.value
Color.RED.nice
Color.RED.code
Color.default()
Color("g")
Color["RED"]
cc = Color("g")
cd = Color["RED"]
ce = Color.default()
print(cc, cd, ce)
for color in Color:
    color.name
list(Color)[0]
Color.__members__


class Num(enum.IntEnum):
    A = 1
    B = enum.auto()


Num.A
Num.A + 1
nsum = Num.A + 1
Num.B.value
print(nsum)


class Fl(enum.Flag):
    X = enum.auto()
    Y = enum.auto()


fl = Fl.X | Fl.Y
print(fl)


@dataclass
class Point:
    x: int
    y: int = 0
    tags: list = field(default_factory=list)
    other: "Optional[Point]" = None

    def dist(self):
        return (self.x**2 + self.y**2) ** 0.5

    def __post_init__(self):
        self.z = self.x + 1


pt = Point(1)
pt.x
pt.tags
pt.z
pt.other
dist = pt.dist()
print(dist)
pt2 = replace(pt, x=2)
pt2.x
T = TypeVar("T")


@dataclass
class Box(Generic[T]):
    content: T
    more: list[T] = field(default_factory=list)

    def get(self) -> T:
        return self.content

    def put(self, c: T) -> "Box[T]":
        return Box(c)


bx = Box(3)
bx.content
bg = bx.get()
bx.put(4).content
bxs = Box("s", ["t"])
bxs.more[0]
bxs.content
print(bg)


class Stack(Generic[T]):
    def __init__(self) -> None:
        self.items: list[T] = []

    def push(self, item: T) -> None:
        self.items.append(item)

    def pop(self) -> T:
        return self.items.pop()


sk = Stack[int]()
sk.push(1)
sp = sk.pop()
print(sp)
NT = namedtuple("NT", "a b")
nt = NT(1, "b")
nt.a
nt.b
nt[1]
na, nb = nt
print(na, nb)
nr = nt._replace(a=3)
nd = nt._asdict()
nm = NT._make([1, 2])
print(nr, nd, nm)


class NT2(NamedTuple):
    a: int
    b: str = "x"

    def both(self):
        return self.a, self.b


n2 = NT2(1)
n2.a
n2.b
n2.both()[1]
n2[0]
qa, qb = n2
print(qa, qb)


class NT3(namedtuple("NT3", ["u", "v"])):
    __slots__ = ()

    def total(self):
        return self.u + self.v  # unknown


n3 = NT3(1, 2)
n3.total()
n3.u


class Desc:
    def __get__(self, obj, owner=None):
        if obj is None:  # unknown
            return self
        return 3.5

    def __set__(self, obj, value):
        pass


class SetName:
    def __set_name__(self, owner, name):
        self.n = name  # unknown

    def __get__(self, obj, owner):
        return self.n  # unknown


class HasDesc:
    d = Desc()
    e = SetName()


hd = HasDesc()
hd.d
hd.e  # unknown


class Meta(type):
    def __call__(cls, *args, **kwargs):
        inst = super().__call__(*args, **kwargs)
        return inst  # unknown

    def registry(cls):
        return [cls]

    @property
    def label(cls):
        return "label"

    def __iter__(cls):
        return iter([cls()])

    def __getitem__(cls, k):
        return k  # unknown

    def __len__(cls):
        return 1


class WithMeta(metaclass=Meta):
    def __init__(self):
        self.v = 1


wm = WithMeta()
wm.v
WithMeta.registry()
WithMeta.label
WithMeta["k"]
for each in WithMeta:
    each.v


class Shape(abc.ABC):
    @abc.abstractmethod
    def area(self): ...

    def double(self):
        return self.area() * 2


class Square(Shape):
    def area(self):
        return 4.0


sq = Square()
sq.double()
sa = sq.double()
print(sa)
shapes = [Square()]
for sh in shapes:
    ar = sh.area()
    print(ar)


def use(shape: Shape):
    ar = shape.area()
    return ar


use(sq)
us = use(sq)
print(us)


class Dyn:
    def __getattr__(self, name):
        return 5


dy = Dyn()
dy.whatever


class Slots:
    __slots__ = ("p", "q")

    def __init__(self):
        self.p = 1
        self.q = "q"


so = Slots()
so.p
so.q


class Single:
    _inst = None

    def __new__(cls, *a):
        if cls._inst is None:
            cls._inst = super().__new__(cls)
        return cls._inst

    @classmethod
    def get(cls):
        if cls._inst is None:
            cls._inst = cls()
        return cls._inst


sg = Single()
sg2 = Single.get()
print(sg, sg2)


class Outer:
    class Inner:
        z = 3

        def m(self):
            return Outer()

    inner = Inner()

    def make(self):
        return self.Inner()


Outer().make().m()
Outer.Inner.z
Outer.inner.z
om = Outer().make()
print(om)


class Mixin:
    def label(self):
        return self.title.upper()


class Page(Mixin):
    def __init__(self):
        self.title = "t"


pg = Page()
pg.label()
pl = pg.label()
print(pl)


class Ext:
    pass


ex = Ext()
ex.thing = Item = 3
ex.thing


class CGI:
    def __class_getitem__(cls, item):
        return [item]  # unknown


cgi = CGI[int]
print(cgi)


class Chain:
    def __init__(self):
        self._where = None

    def where(self, c):
        self._where = c
        return self

    def all(self):
        return [Derived("a")]


Chain().where(1).where(2).all()[0].extra
lm = lambda: Derived("l")
lm().extra


class Node:
    def __init__(self, parent=None):
        self.parent = parent
        self.next = None


n = Node(Node())
n.parent
n.next = Node()
n.next.parent


class It:
    def __init__(self):
        self.i = 0

    def __iter__(self):
        return self

    def __next__(self):
        self.i += 1
        if self.i > 3:
            raise StopIteration
        return Derived("x")


for e in It():
    e.extra
list(It())[0].extra
nx = next(It())
nx.extra


class GI:
    def __getitem__(self, i):
        if i > 2:  # unknown
            raise IndexError
        return 2.5


for g in GI():
    g


class Cmp:
    def __lt__(self, o):
        return True

    def __neg__(self):
        return 1

    def __invert__(self):
        return "i"

    def __radd__(self, o):
        return 2.5

    def __iadd__(self, o):
        return self

    def __mul__(self, o):
        return "m"

    def __matmul__(self, o):
        return b"m"

    def __int__(self):
        return 1

    def __abs__(self):
        return 3.0

    def __divmod__(self, o):
        return (1, "a")

    def __round__(self, n=None):
        return 3

    def __reversed__(self):
        return iter([1])

    def __pow__(self, o):
        return []

    def __index__(self):
        return 1

    def __str__(self):
        return "s"

    def __format__(self, s):
        return "f"


c = Cmp()
c1 = -c
c2 = ~c
c3 = 1 + c
c += 1
c4 = c * 3
c5 = c @ c
c6 = int(c)
c7 = abs(c)
c8 = divmod(c, 1)
c9 = round(c)
c10 = c**2
c11 = str(c)
c12 = c < c
print(c, c1, c2, c3, c4, c5, c6, c7, c8, c9, c10, c11, c12)
c8[1]
