import functools
import itertools
import contextlib
import operator


class Res:
    val = 1

    def go(self):
        return "go"


def deco(f):
    @functools.wraps(f)
    def wrapper(*args, **kwargs):
        return f(*args, **kwargs)

    return wrapper


def deco_args(n):
    def inner(f):
        @functools.wraps(f)
        def wrapper(*args, **kwargs):
            return [f(*args, **kwargs)] * n  # unknown

        return wrapper

    return inner


def deco_plain(f):
    def wrapper(*args):
        r = f(*args)
        return r

    return wrapper


def deco_same(f):
    f.attr = 1
    return f


def deco_opt(f=None, *, flag=False):
    if f is None:
        return lambda g: deco_opt(g, flag=flag)

    @functools.wraps(f)
    def w(*a):
        return f(*a)

    return w


class DecoClass:
    def __init__(self, f):
        self.f = f
        self.count = 0

    def __call__(self, *args):
        self.count += 1
        return self.f(*args)


class DecoClassArgs:
    def __init__(self, n):
        self.n = n  # unknown

    def __call__(self, f):
        def w(*a):
            return f(*a)  # unknown

        return w


@deco
def f1():
    return Res()


@deco_args(3)
def f2():
    return Res()


@deco_plain
def f3():
    return Res()


@deco_same
def f4():
    return Res()


@deco_opt
def f5():
    return Res()


@deco_opt(flag=True)
def f6():
    return Res()


@DecoClass
def f7():
    return Res()


@DecoClassArgs(1)
def f8():
    return Res()


@functools.lru_cache(maxsize=None)
def f9(x):
    return Res()


@functools.lru_cache
def f10(x):
    return Res()


@functools.cache
def f11():
    return Res()


@contextlib.contextmanager
def f12():
    yield Res()


@functools.singledispatch
def f13(x):
    return Res()


@f13.register(int)  # unknown
def _(x):
    return "int"


a1 = f1()
a2 = f2()
a3 = f3()
a4 = f4()
a5 = f5()
a6 = f6()
a7 = f7()
a8 = f8()
a9 = f9(1)
a10 = f10(1)
a11 = f11()
print(a1, a2[0], a3, a4, a5, a6, a7, a8, a9, a10, a11)
a1.val
with f12() as a12:
    a12.val
f7.count
f9.cache_info()
a13 = f13("s")  # unknown


def gen():
    yield 1
    yield 2


def gen2():
    x = yield Res()
    return "done"


def gen3():
    r = yield from gen2()
    print(r)
    yield from gen()


for g in gen():
    g
for g3 in gen3():
    g3
next(gen())
gg = next(gen2())
gg.val
ge = (x.val for x in [Res()])
next(ge)
gl = list(gen())
gl[0]
gs = sum(gen())
print(gs, gl)


def ident(x):
    return x


def star(*args):
    return args


def kw(**kwargs):
    return kwargs


def kwget(**kwargs):
    return kwargs["a"]


def starget(*args):
    return args[0]


def both(a, b=2, *c, d=4.0, **e):
    return a, b, c, d, e


i1 = ident(Res())
i2 = ident(3)
i3 = star(1, "a")
i4 = kw(a=1)
i5 = kwget(a=Res())
i6 = starget(Res())
i7 = both(1, "b", 3, d=5, z=Res())
i8 = i7[4]["z"]
i9 = i7[2]
print(i1, i2, i3, i4, i5, i6, i7, i8, i9, i3[1])


def outer():
    x = Res()

    def inner():
        return x

    return inner


o1 = outer()()
o1.val


def counter():
    n = 0

    def inc():
        nonlocal n
        n += 1
        return n

    return inc


ct = counter()
ct()
cv = ct()
print(cv)


def default(x=Res()):
    return x


default()
dfr = default()
print(dfr)


def maybe(flag):
    if flag:
        return Res()


def maybe2(flag):
    if flag:
        return Res()
    else:
        return None


def never():
    raise ValueError


def loop():
    while True:
        return Res()


def tryret():
    try:
        return Res()
    except ValueError:
        return None
    finally:
        print()


def tryelse():
    try:
        v = Res()
    except Exception as exc:
        print(exc)
        raise
    else:
        return v


def nothing():
    pass


def withret():
    with open("/dev/null") as f:
        return f.read()


m1 = maybe(True)
m1b = maybe(False)
m2 = maybe2(True)
m3 = loop()
m4 = tryret()
m5 = tryelse()
m6 = nothing()
m7 = withret()
print(m1, m1b, m2, m3, m4, m5, m6, m7)
p1 = functools.partial(ident, Res())
p2 = p1()
p2.val
p3 = functools.partial(both, 1)
p4 = p3(2)
print(p4)
r1 = functools.reduce(lambda a, b: a + b, [1, 2])
r2 = functools.reduce(operator.add, [1.0, 2.0])
print(r1, r2)
it1 = itertools.chain([1], [2])
list(it1)[0]
it2 = list(itertools.chain.from_iterable([[Res()]]))
it2[0]
for c in itertools.count():
    c
    break
it3 = list(itertools.product([1], ["a"]))
it3[0][1]
it4 = list(itertools.combinations([1, 2], 2))
it4[0]
it5 = list(itertools.groupby([Res()], key=lambda r: r.val))
for key, group in itertools.groupby([Res()], key=lambda r: r.val):
    key
    group
    for member in group:
        member.val
it6 = list(itertools.islice([Res()], 1))
it6[0]
it7 = list(itertools.zip_longest([1], ["a"]))
it7[0]
it8 = list(itertools.permutations([1, 2]))
it8[0]
it9 = list(itertools.starmap(ident, [(1,)]))
it9[0]
it10 = list(itertools.accumulate([1, 2]))
it10[0]
it11 = list(itertools.takewhile(lambda r: r.val, [Res()]))
it11[0]
it12 = itertools.repeat(Res(), 1)
next(it12).val
it13 = itertools.cycle([Res()])
next(it13).val
t1, t2 = itertools.tee([1])
next(t1)
mp = list(map(ident, [Res()]))
mp[0]
mp2 = list(map(str, [1]))
mp2[0]
mp3 = list(map(lambda x, y: x + y, [1], [2]))
mp3[0]
mp4 = list(map(Res.go, [Res()]))
mp4[0]
mp5 = [fn() for fn in [outer, gen]]
fns = {"a": f1, "b": ident}
fns["a"]().val
fl = [f1, outer]
fl[0]().val
comp = (lambda f, g: lambda x: f(g(x)))(str, int)
comp("1")
cps = comp("1")
print(cps)


def compose(f, g):
    return lambda x: f(g(x))


cq = compose(ident, ident)(Res())
print(cq)


def apply(f, *args):
    return f(*args)


ap = apply(ident, Res())
print(ap)
ap2 = apply(Res)
print(ap2)


def rec(n):
    if n == 0:
        return Res()
    return rec(n - 1)


rc = rec(2)
print(rc)


def fact(n):
    return 1 if n < 2 else n * fact(n - 1)


fc = fact(3)
print(fc)


def even(n):
    return True if n == 0 else odd(n - 1)


def odd(n):
    return False if n == 0 else even(n - 1)


ev = even(4)
print(ev)


class CM:
    def __enter__(self):
        return Res()

    def __exit__(self, *a):
        pass


with CM() as cm:
    cm.val
with contextlib.suppress(ValueError):
    pass
with contextlib.ExitStack() as es:
    cme = es.enter_context(CM())
    cme.val
with contextlib.closing(open("/dev/null")) as cl:
    cl
with contextlib.nullcontext(Res()) as nc:
    nc.val


class Cls:
    @contextlib.contextmanager
    def session(self):
        yield Res()

    @functools.wraps(ident)
    def w(self):
        return 1

    @deco
    def meth(self):
        return self

    @property
    @deco
    def pr(self):
        return Res()

    @classmethod
    @contextlib.contextmanager
    def cms(cls):
        yield cls()

    @functools.lru_cache(None)
    def lru(self):
        return Res()

    pm = functools.partialmethod(meth)
    alias = meth
    lam = lambda self: self

    def cb(self):
        return self.meth


with Cls().session() as se:
    se.val
Cls().meth().meth()
Cls().pr.val
with Cls.cms() as cmss:
    cmss.pr
Cls().lru().val  # unknown
Cls().alias().lam().pr
Cls().cb()().pr
if (wal := Res()) and wal.val:
    wal.go()
co = Res() if f1 else None
print(co)
an = Res() or None
an2 = None or Res()
an3 = 0 or "a"
an4 = 1 and "a"
print(an, an2, an3, an4)
try:
    raise KeyError("x")
except (KeyError, ValueError) as err:
    err
    err.args
try:
    raise KeyError("x")
except KeyError as err2:
    err2.args[0]


class MyErr(Exception):
    def __init__(self, code):
        super().__init__(code)
        self.code = code


try:
    raise MyErr(3)
except MyErr as me:
    me.code
    me.args
del t1
global_v = None


def setg():
    global global_v
    global_v = Res()


setg()
global_v.val
assert isinstance(global_v, Res)
global_v.go()
sortd = sorted([Res()], key=lambda z: z.val)
sortd[0]
mn = min([Res()], key=lambda z: z.val)
mn.val
mx = max(1, 2.5)
print(mx)
an5 = any([1])
al = all([])
ab = abs(-1)
rd = round(1.5)
rd2 = round(1.5, 1)
dm = divmod(3, 2)
pw = pow(2, 3)
hs = hash("a")
idd = id(1)
od = ord("a")
ch = chr(3)
bn = bin(3)
inp = repr(1)
ty = type(Res())
ty().val
iss = isinstance(1, int)
ca = callable(f1)
ga = getattr(Res(), "val")
ga2 = getattr(Res(), "nope", None)
ga3 = getattr(Res(), "go")()
vs = vars(Res())
dr = dir(Res())
sl = slice(1)
zp = dict(zip(["a"], [Res()]))
zp["a"].val
en = dict(enumerate([Res()]))
en[0].val
rv = reversed([Res()])
for rvv in rv:
    rvv.val
print(an5, al, ab, rd, rd2, dm, pw, hs, idd, od, ch, bn, inp, ty, iss, ca, ga, ga2, ga3, vs, dr, sl)
n1 = 1 + 1
n2 = 1 + 1.0
n3 = 1 / 2
n4 = 1 // 2
n5 = 2**2
n6 = 2.0**2
n7 = 1j + 1
n8 = True + 1
n9 = 3 % 2
n10 = 1 << 2
n11 = -1
n12 = ~1
n13 = 2**-1
n14 = "a" * 3
n15 = 3 * "a"
n16 = [1] * 3
n17 = 3 * [1]
n18 = "a" + "b"
n19 = b"a" + b"b"
n20 = 1 < 2
n21 = 1 if n20 else "a"
n22 = True & False
n23 = not 1
n24 = +True
n25 = (1,) * 2
n26 = 5 & 1
n27 = 1.5 // 1
n28 = 7 - 2.0
print(
    n1,
    n2,
    n3,
    n4,
    n5,
    n6,
    n7,
    n8,
    n9,
    n10,
    n11,
    n12,
    n13,
    n14,
    n15,
    n16,
    n17,
    n18,
    n19,
    n20,
    n21,
    n22,
    n23,
    n24,
    n25,
    n26,
    n27,
    n28,
)
