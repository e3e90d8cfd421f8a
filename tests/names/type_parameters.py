class C[T: (__p, int), *Ts, **P](Base[T], __q, metaclass=__M[T]):
    __p = T
    def m[U: T](self, x: U = __p, *a: *Ts, **k: P.kwargs) -> C[U]:
        def i[V](y: V): return U, T, V, __p, self.__z
        return __class__, super(), [T for T in U]
    type Al[W] = W | T | __p
    type Al2 = T
    class N[T](C[T]): x: T
    @deco[T](lambda: T)
    async def am[T](self): pass
type X[T: int, *Ts, **P] = dict[T, Callable[P, T]] | X
type type = type
def g[T](x: T, y=lambda: T) -> (lambda z: T): 
    nonlocal_ = T
    class Inner[S]: z = S, T, [S for _ in T]
def outer():
    T = 1
    def g[T](): 
        def h():
            return T
        T2 = 1
        return T
    class D:
        T = 2
        def m[U: T](self, a: T = T): return T
        z = [T for _ in [T]]
match x:
    case {"k": v, 1: [a, *_], **rest} if v: pass
    case C(a, b=c.d, e=C2(f)) | C3(a, f): pass
    case [a, (b), *c] as whole: pass
    case -1 | 1+2j | "s" "t" | None | c.D: pass
    case _: pass
match(a, b)
match = case = type = _ = 1
match[a]; case(b); type(c)
print(f"{x!r:{y}} {f'{z}' + f"{w:{v}}"} {(lambda: q)} {a:=^10}")
try: pass
except* E as e: pass
def p(a, /, b, *, c): pass
