"""Calls of all kinds, and what wraps what."""
import functools
from functools import partial, wraps, reduce, lru_cache
from contextlib import contextmanager
import operator as op


def traced(f):
    @wraps(f)
    def inner(*args, **kwargs):
        """Inner."""
        return f(*args, **kwargs)
    return inner


def repeat(times=2, *, until: "int | None" = None):
    def decorate(f):
        @functools.wraps(f)
        def wrapper(*a, **k):
            for _ in range(times): result = f(*a, **k)
            return result
        wrapper.times = times
        return wrapper
    return decorate


class Counted:
    def __init__(self, f): self.f = f; self.count = 0
    def __call__(self, *args): self.count += 1; return self.f(*args)
    def __get__(self, obj, owner): return partial(self, obj)


@traced
def plain(a, b=1, /, c=2, *args, d, e=3, **kwargs): return a
@repeat(times=3, until=None)
def repeated(x: int) -> str: "Doc."; return str(x)
@Counted
def counted(x, y): return x
@lru_cache(maxsize=None)
def cached(n: int) -> int: return n if n < 2 else cached(n - 1) + cached(n - 2)
@staticmethod
def odd_static(): return 1


class Service:
    registry = {}
    handlers = {"a": plain, "b": counted}
    @classmethod
    def create(cls, *a, **k) -> "Service": return cls(*a, **k)
    @staticmethod
    @traced
    def helper(x, y): return x or y
    @traced
    def method(self, x): return self.other(x)
    def other(self, x): return self.method(x)
    @repeat()
    def many(self, n=1): return [self] * n
    @contextmanager
    def session(self, *, name="s"): yield self
    @Counted
    def counted(self, x): return x
    @property
    def items(self) -> "list[int]": return [1]
    @items.getter
    def items(self): return [2]
    def __getitem__(self, key): return self.handlers[key]
    def __iadd__(self, other): return self
    def __matmul__(self, other): return 1.0
    def __rsub__(self, other): return "r"
    def __invert__(self): return ~1
    def __neg__(self): return -1
    def __next__(self): return 5
    def __iter__(self): return self
    def __len__(self): return 3
    def __or__(self, other): return NotImplemented


plain(1, 2, 3, 4, 5, d=6, e=7, f=8)
plain(*[1, 2], **{"d": 1}, e=2)
plain(1, d=(x for x in []), *[3])
plain(d=1)
plain(
    1,
    2, c=
    3, d=
)
repeated(1).upper()
repeated.times
counted(1, 2)
counted.count
cached(10)
service = Service.create()
Service.helper(1, 2)
Service.method(service, 3)
bound = service.method
bound(4)
service.many(n=2)[0].many()
with service.session(name="x") as s, Service().session() as t: s.items
service["a"](1, d=2)
service += 1
m = service @ 2
r = 1 - service
i, n = ~service, -service
for five in service: five
nothing = service | 1
half = partial(plain, 1, d=2)
half(3)
method = partial(Service.other, service)(1)
getattr(service, "method")(1)
setattr(service, "new", 1)
mapped = list(map(lambda z: z.items, [service])), sorted([service], key=lambda v: v.other(1))
reduce(op.add, [1, 2], 0)
(lambda a, b=2: a)(1)
(plain if m else counted)(1, 2)
[plain, counted][0](1)
print("%s" % 1, sep="", file=None)
super
int("3").bit_length(), "a,b".split(","), {}.get("a", 1), [].append(1), max([1]), max(1, 2), next(iter("a"), None)
abs(-1), len([1]), sum([1]), zip("a", [1]), enumerate("a", 1), reversed([1]), isinstance(1, int), type(1), type("A", (), {})
"".join(str(k) + v for k, v in {1: "a"}.items())
dict(a=1)["a"], list(), set([1]), frozenset({1}), tuple([1]), bytes(), object(), range(3)
