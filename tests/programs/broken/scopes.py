"""What the grammar takes and the language does not."""
return 1
yield 2
await x
break
continue
nonlocal top
from __future__ import division
global g
def f(a):
    global a
    nonlocal b
    x = 1
    global x
    print(y)
    nonlocal y
    global z, z
    z: int = 1
    from m import *
    def g():
        nonlocal x, missing
        nonlocal x
        global x
        return 1
        yield
    async def h():
        yield 1
        return 2
        yield from x
        [await a for a in b]
        return [a async for a in b]
    class C:
        nonlocal a
        return 1
        yield
        break
        x = yield
        def __init__(self): return __class__
        super: int
    for i in x:
        def inner():
            break
            continue
        class D:
            continue
        if x: break
        else: continue
    while x:
        pass
    else:
        break
    try:
        pass
    finally:
        for i in x: continue
        return
    lambda: (yield)
    [(yield) for x in y]
    [i := 1 for i in y]
    [j for k in (j := y)]
    [[i := 0 for j in y] for i in y]
    class E: [q := 1 for w in y]
    with x as a, b as a: pass
    del __debug__, (a, None)
    x: int = 1; x: str
    def dup(a, b, a, *, b, **a): pass
    lambda a, a: 1
    C(b=1, b=2)
    try: pass
    except* x: return
    try: pass
    except* x: pass
    except y: pass
    match x:
        case y: pass
        case 1: pass
    match x:
        case a | b: pass
        case [a, a]: pass
        case {"a": 1, "a": 2}: pass
        case C(x=1, x=2): pass
def t[T, T](x: (y := 1)) -> (yield): nonlocal T; global T; T = 1
class G[T](x := 1): x: T = (yield); nonlocal T
type A[T] = (yield)
type A[T: (await x)] = [x := 1 for x in y]
def n(a: (yield) = (yield), *b: [x := 1], c=(await d)): pass
async def comp(): return {x async for x in y}, (await z for z in w), [[x async for x in y] for z in w], lambda: await x
def notasync(): return [x async for x in y], (x async for x in y), await z
class S:
    __slots__ = ("a",)
    a = 1
    def m(self): __x = self.__y; del self.__z; global __w; import __v, __u.__t as __s; return lambda __r: __r
print(undefined, f, undefined.attr, later); del undefined; later = 1
x = 1; global x
import sys as x, y.z as None
from a import b as __debug__
f"{(yield)}" f"{await x}" f"{x!r:{y := 1}}"
assert (x, "m")
"a" is 1; () is (); x is -1; 1(); "a"[1.5]; [1][1, 2]; (1)(2); f"a"(1); 1 in 2
