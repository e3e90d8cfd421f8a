import a.b.c as x, d.e
from .. import f
from ...g.h import i as j
def gen(): return (yield), [z for z in (yield_ for yield_ in q)]
class K(object):
    global glob
    glob = 1
    nl = glob
    def glob(self): return glob
    del nl
    for nl in range(3): pass
    [w for w in nl if (lambda: nl)]
    import os
    from os import path as os
    with a as b: pass
    try: 1
    except X as nl: pass
    lambda: __class__
    def m1(self): return [super().x for q in self]
    def m2(self): return lambda: super()
    def m3(self):
        class __class__: pass
    class Z:
        def m4(self): return __class__
def outer(p, q=1):
    def inner():
        nonlocal p
        p = q
        class L:
            p = p
            q = q
            r = [p for _ in q]
            def meth(self): return p, q, r
        return L
    def other(q):
        return [q for q in q], {p: q for p in q}, (p for p in q if (lambda q=q: p))
    global gq
    gq = [gq2 := v for v in p]
    (lambda: (yy := 1))
    def dflt(a=[p for p in q], *, b=(lambda: p)): return a
    @p
    class Deco(p, q, r=p): pass
    return inner, other
def shadow():
    x = 1
    del x
    def f(): return x
    for i in x: 
        def f2():
            nonlocal i
            i = 1
    try: pass
    except E as x: pass
    import sys.path
    def g(): return sys, E
def e(): 
    exec("x")
    locals()
def rec(): return rec
class Rec:
    def rec(self): return Rec, rec
x: int
def ann():
    a: int
    b: int = 1
    c.d: int
    e[f]: int = 3
    (g): int
    def h(): return a, b, g
    global_: "G"
_, __, ___ = 1, 2, 3
class _: 
    __x = 1
class __:
    __x = 2
class _Priv:
    __x = 3
    x__ = __y__ = __z_ = 1
    def f(self): self.__x.__y.z; import __im.__sub; from __mod import __name as __as; global __g; __g = 1; f(__kw=1)
