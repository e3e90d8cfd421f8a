f(a, b(), *c, **d)

a [0] (x)

not (a) or -(b)

(f)(x)

None is True or not False

while x: pass

match = case = type = _ = 1

a.b.c()

(a).b

((a.b)).c

a().b

a[i].b

(a or b).c

(a,).c

(-a).c

(x := a).c

[a].c

's'.join(a)

a.b = (a # type: int
 .c)

f(x, k=v, **o)

f((k==v), g(k=1))

f(a
=1)

a = b = c

a, (b, *c), [d] = e

a[i].b = c

a[i] = f(x).y = z

(a).b = (c.d) = e

(a, b)[0].c = d

x += y

x -= y

x @= y

x.y **= z

f = lambda: a == b

x: int = y

x: int

(x): A[b]

self.x: int

x: lambda: y = z

a[x]: int = y

for a, b.c, d[e] in f: g

for x in a, b: y = x

async for x in y: pass

with a as b, c() as (d, e.f), g: h = i

with (a as b, c as d[0],): pass

except (A, B.c) as e: raise

except* A as e: pass

except A, B: pass

del a, (b.c, d[e]), [f]

if (n := f(a)) > n: pass

f(n := a, k=(m := b))

if a: b = c; d.e = f

else: x: int = y

while lambda: a: del b

if x[a:b]: import c

class A: x = y

import a.b.c, d as e, f.g as h

from a.b import (c, d as e, # type: ignore
 f)

from . import a
from ...b import c

from a import *

def f():
  pass
from a import *

match x, *y:

match x:
  case a.b | C(d, e=f) | {g.h: i, **j} as k if a == k: l = a

match x:
  case [a, *_, (b), _]: pass
  case _: pass

match x:
  case m.C(): pass
  case {'a': -1}: pass

match(x)
case = match[y]

µ = 1
μ

class C:
  x = 1
  y: x
  def f(a: x): a

x = 1
def f():
  print(x)
x
print(x)

