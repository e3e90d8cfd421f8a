class A(B, metaclass=M, **kw):
    __slots__ = ("x",)
    x: int
    (y): int
    z.w: int = 3
    a[0]: str
    __p: int = 1
    def f(self, __q=__p, *args: __p, k: "__p" = [i for i in __p], **kws) -> None:
        super().f(__q)
        def g():
            nonlocal __q
            __q = __class__
            del __q
            return lambda: (__q, self.__p, __mangled__)
        return [[__q for __q in self] for j in k if (last := j)]
    class __In:
        class In2(__In): __v = 1
        def m(self): return __In, super
    t = [x for x in x if x]
    u = {x: y for x in t for y in x}
    v = (lambda x=x: x)
    async def co(self):
        async with a as (b, *c), d as e[0], f as g.h: await b
        async for i, (j.k, l[m]) in n: yield i
        z = [i async for i in n]
global G
G = 1
def deep():
    global G, H
    def mid():
        def inner():
            return G, H, K, deepvar, unbound
        K = 1
        return inner
    G += 1
    for H in range(3): pass
    import os.path, sys as system
    from .pkg import name as alias, other
    from . import rel
    try: pass
    except (E1, m.E2) as exc: raise exc from exc
    finally: del exc
    deepvar = 1
    with open(f) as fh, (yield x) as w: pass
    x = y = z, *rest = fh, w
    a, [b, (c, *d)], e.f, g[h], (i) = j
    assert x, y
    print(*x, **y, sep=z, end=lambda k: k)
    (n) = 1; (n.m) = 2; [o] = p; [] = q
    return mid, (yield), (yield from it)
def kw(a, *, b: c = d, **e): return a if b else e
def star(*, only): pass
f = lambda *a, k=1, **kw: (a, k, kw)
print(f"{a!r:>{width}.{prec}} {b['k']} {(lambda q: q)(c)} {d:%Y} {{no}} {e=} {f'{nested!s}'}" "plain" f'{g}')
x = lambda: (yield)
(a) += 1
a.b += 1; a[b] -= c
@deco
@m.deco(arg, key=val)
class Dec: pass
if (n := len(a)) > 10 and [q := 1, q**2]: pass
while (m := f(n)): n = m
res = [y := f(x), y**2]
comp = [last2 := v for v in w]
def fn():
    return [(k := v, [k for v2 in kk]) for v in w] if 0 else 0
for a.b in c: pass
for a[b] in c: pass
else: d
del a, (b, [c]), d.e, f[g]
x = not y in z is not w
s = x[1:2, ::3, ...]
s = x[a:b:c]
t: 'List[Undefined]' = None
def ann(x: 'U', y: "a.b[c]") -> 'R': v: "local" = 1; return v
import a.b.c
import a.b.c as d
from a.b import (c, d as e,)
from m import *
nonascii_ﬁ = fi
class Ä:
    __ä = 1
    def é(self): return self.__ä, __ä
