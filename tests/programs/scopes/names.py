"""Names and whose they are."""
import os.path as p, sys, a.b.c
from math import *
from . import other as o, missing
from .other import (shared, hidden as _hidden,)

counter = 0
global_only: int
if counter: conditional = 1
x = y = [0]
x[0], y[:] = 1, [2]
(z) = 3
[q, (r, *s)] = 1, (2, 3)
w: "list[p]" = []
(v): int = 1
x[0]: int = 2
o.attr: str = "a"
t = u = lambda a, *b, c=counter, **d: (a, b, c, d, counter)


def outer(parameter, default=counter, *args: int, key: "str" = "k", **kwargs: "o.Shared") -> "Outer":
    """A docstring with counter."""
    global counter, made_here
    local = parameter
    made_here = counter = local

    def inner(default=local):
        nonlocal local, parameter
        local = default
        free = key
        class Local(Outer):
            local = local
            free = free
            def method(self):
                return local, free, __class__, self.__mangled
        return Local
    for local in args: pass
    del local
    return inner(), locals(), [kwargs for kwargs in kwargs if (walrus := kwargs)], walrus


class Outer:
    attribute = counter
    other = attribute
    __mangled = 1
    def method(self, attribute=attribute): return attribute, self.attribute, Outer.__mangled
    renamed = method
    squares = [attribute for i in range(attribute)]
    pairs = {a: b for a in (attribute,) for b in [a]}
    class Inner:
        attribute = attribute
        def __init__(self): self.x, self.y.z, self[0] = attribute, 1, 2
    method2 = lambda self, attribute=attribute: self.method(attribute)
    if attribute:
        def late(self): pass
    else:
        late = None
    for looped in range(3): exec("late")
    @property
    def prop(self): return self.__mangled
    @prop.setter
    def prop(self, value): self.__mangled = value


def shadows(str, list=list):
    int = str(list)
    import sys
    from sys import path as sys_path
    def sys_path(): return sys
    class int(int): pass
    try: import json
    except ImportError as json: json = None
    with int as (a, b), a.c: pass
    return int, [str for str in str for str in str], {str for _ in str}, (str for _ in list), json


def not_found():
    print(nowhere, later, __name__, __file__, __builtins__, reveal_type)
    def later_use(): return later
    if (a := 1) and (b := a): pass
    [c := 1 for d in range(3)]
    print(a, b, c, d)
    later = 1
    match a:
        case [a, *b] | {"k": a, **b}: pass
        case Outer(attribute=c) as whole: pass
    return whole


type Alias[T: int, *Ts, **P] = dict[T, tuple[*Ts]]
def generic[T = int](x: T, y: "T") -> T: return x
class Generic[T: (int, str), U]:
    field: T
    def method[V](self, v: V) -> "tuple[T, V]": type Inner = T; return self.field, v
assert generic, Generic
print(global_only, made_here, walrus, sin, shared, _hidden, missing, o.Shared, conditional)
def annotated_later():
    def inner():
        nonlocal early
        global early_global
        early_global: int = 1
        early = early_global
    early: str = "a"
    exec("early_global"); eval("early")
    del early
    return inner
early_global = 2
def deletes():
    x = 1
    def uses(): return x
    del x
    return uses, f"{x}", "x"
