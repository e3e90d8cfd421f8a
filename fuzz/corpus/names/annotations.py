from __future__ import annotations

(x): (y := z)
x.y: lambda a: a
x: [T for T in "A['B']"] = y

def f(a: lambda: b, *c: [d for d in a], e: (g := h) = i) -> "f": x: T

class A[T: (__p, [__T for __T in T]), __T = lambda: T](B[T], __q, metaclass=__M[T]):
  __x: __T = __q
  def f[*__Ts = T](self, x: __x): return super, __class__
  type __X[T] = [__X for _ in T]

def f():
  x: lambda: (x, f)
  del x[y: T], x = y: T
