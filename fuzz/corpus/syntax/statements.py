import a.b as c, d
from ...e import (f, g as h,)
from . import *
a = b.c, [d, *e[0]] = f  # type: List[int]
a += yield; a: 'List["B"]' = cast('C', d)
del a, (b, c), d[0]
assert a, b
raise a from b
global a, b
@a.b(c)
@e
async def f[T: int = str, *U, **V](a, /, b: 'C' = 1, *, d, **e) -> 'T':
  # type: (...) -> None
  if a: return b; pass
  elif c: yield
  else:
    for a, b in c, d: pass
    async for f in g: break
class C[T](B, metaclass=M): x = 1; y
type A[T] = list[T]
with a as b, (c): pass
with (a as b, c,): pass
try: pass
except* (A, B) as e: pass
finally: pass
match a, b:
  case 1 | -2 | 'x' | None if g: pass
  case [a, *_] | (b,) | {'k': v, **r} | C.D(x, y=E.F) as z: pass
  case _: pass
print >>f, a, b,
exec a in b, c
except A, e: pass
def f(a,  # type: int
      (b, (c,))=1): pass
