"""Loops, matches and withs that end, or do not."""
def a(xs):
    for x in xs:
        with open(x) as f:
            if f: break
            return f
        value = 1
    else:
        value = "none"
    return value
def b(xs):
    while True:
        with xs:
            return 1
    never = 2
    return never
def c(xs, n):
    for x in xs:
        for y in x:
            if y: break
            while y:
                if n: continue
                break
            else: n = "w"
        else:
            n = 1
            continue
        n = 2.0
        break
    return n
def d(s):
    match s:
        case 1: return 1
        case _: return "x"
    unreached = 1
    return unreached
def e(s):
    while s:
        match s:
            case 1: break
            case [x, y]: continue
            case other: s = other
    else: s = None
    match s:
        case 1: r = 1
        case 2: raise ValueError
    return r, s
def f(x):
    try: return x.a
    except: pass
    finally:
        if x: x = 1
        else: x = "b"
    return x
def g(x):
    while 1:
        try:
            x = next(x)
            break
        except StopIteration: continue
        except (ValueError, KeyError): return
        finally: done = 1
    return x, done
def h(x):
    if x: raise
    elif not x: return
    else: pass
    dead = 1
    while False: never = 1
    while not False: always = 1; break
    if True: yes = 1
    else: no = 1
    if 0: no2 = 1
    elif 1: yes2 = 1
    if __debug__: dbg = 1
    if not True: gone = 1
    return yes, no, no2, yes2, dbg, gone, always, never, dead
def i(x):
    del x
    x = 1
    def inner(): return x
    x = "a"
    if inner(): del x
    else: x = 2.0
    return x
async def j(x):
    async for y in x:
        async with y as z: return z
    else: y = None
    try:
        await x
    except* ValueError as v: z = v
    except* KeyError: z = 1
    else: z = 2
    return y, z
def k():
    global made; made = 1
    def l(): nonlocal_ = made; return nonlocal_
    class C:
        made = made
        for made in [1]: other = made
        del made
        try: x = 1
        except: x = 2
        with l() as y, l(): pass
        while x: x = None; break
        import sys as s
        [q for q in [made]]
    return C.x, C.other, C.made, C.y, C.s, l()
def m(flag):
    if flag: import json as lib
    else: lib = None
    if flag:
        def fn(): return 1
    else:
        def fn(): return "a"
    if flag:
        class K: x = 1
    else:
        class K: x = "a"
    fn = fn if flag else None
    return lib, fn(), K.x, K().x
def n(x: "int | str | None", y=None):
    if x is None or isinstance(x, str): return x
    z = x
    if not (y is None or x): y
    while x is not None and (y := x): x = None if y else "s"
    if isinstance(x, int) is True: x
    if not isinstance(y, (list, tuple)): y = [y]
    if type(x) in (int, str) and x == y != 3: x
    if (x, y) == (1, 2): x
    if x and not y or z: x
    if x == "a" or x == "b": x
    if x not in (None, 1): x
    if len(y) == 2: p, q = y
    x = x if x is not None else y
    [w for w in y if isinstance(w, int)]
    assert not isinstance(x, int), x
    assert x, y; assert (x and y); assert False
    return x, y, z
class Lazy:
    _x = None
    def get(self):
        if self._x is None: self._x = 1
        if self._x: return self._x
        elif isinstance(self._x, str): return self._x.upper()
        if self.other.deep is not None: self.other.deep
        self.other = Lazy(); self.other._x = "s"; return self.other._x
for o in range(3):
    if o: break
else: o = None
try: import fast
except ImportError: fast = None
else: del fast
p = 1
if p: p = "a"
with open("x") as p: r = p
while p: p = p.x
print(o, p, r, fast)
