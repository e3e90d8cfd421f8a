"""One fault a line, as people make them."""
if x
if x: y: z
if: pass
if x = 1: pass
elif x: pass
else: pass
else x: pass
while
while x pass
for x y: pass
for x in: pass
for in y: pass
for 1 in y: pass
for x, f() in y: pass
for x in y z: pass
async for x in y
async x = 1
async
try
try x: pass
except: pass
except x as: pass
except x as 1: pass
except x, y: pass
except x as y.z: pass
except* : pass
except *x as y: pass
finally x: pass
with: pass
with x as: pass
with x as f(): pass
with (x as y, z as (a, 1)): pass
with x as y z: pass
with (x, y as z: pass
def: pass
def f: pass
def f(: pass
def f(x: pass
def f(x,, y): pass
def f(x, x): pass
def f(x=1, y): pass
def f(*): pass
def f(*, **k): pass
def f(*a, *b): pass
def f(**k, x): pass
def f(**k, **l): pass
def f(/, x): pass
def f(x, /, y, /): pass
def f(*a, /): pass
def f(x: int = ): pass
def f((a, b)): pass
def f(1): pass
def f(x.y): pass
def f(lambda): pass
def f(**k=1): pass
def f(*a=1): pass
def f() -> : pass
def f() - > int: pass
def f[T(x): pass
def f[](x): pass
def f[T: int = str, *Ts = int, **P = [int], 1](): pass
def f() pass
def 1(): pass
def None(): pass
def f.g(): pass
class: pass
class C(: pass
class C(x: pass
class C pass
class C(*a, **b, x for x in y): pass
class C[T: pass
class 1: pass
class C(x=): pass
@
@x y
@1 +
@x
x = 1
return
return x y
return *
yield = 1
def f(): yield from; yield *x, ; return yield
raise x from
raise from x
raise x, y, z, w
import
import x as
import x.
import .x
import x y
import *
import (x)
import x as y.z
from
from x
from x import
from x import (
from x import y,
from x import (y, z
from x import ()
from x import *, y
from x import y as
from x import y as 1
from .. import
from .x. import y
from __future__ import nothing
from __future__ import braces
from __future__ import annotations as a
from x import y z
global
global x,
global x.y
nonlocal 1
nonlocal x
del
del 1
del f()
del x y
del (x, 1), [y, f()]
del *x
assert
assert x,
assert x y
pass x
break
continue
break x
continue 1
type
type X
type X =
type X[T = int
type X[T] = int = str
type 1 = 2
type X.y = 1
match
match x
match x: pass
match x y:
    case 1: pass
match x:
    case: pass
    case 1 pass
    case x.: pass
    case x(: pass
    case {1, 2}: pass
    case {x: 1}: pass
    case {**a, 1: 2}: pass
    case {**_}: pass
    case [*a, *b]: pass
    case *a: pass
    case 1 | : pass
    case x | y: pass
    case a as 1: pass
    case a as b.c: pass
    case a as _: pass
    case C(a=1, b): pass
    case C(a=1, a=2): pass
    case 1 + 2: pass
    case 1 + 2j: pass
    case -x: pass
    case -1 - 2j | +3: pass
    case f"x": pass
    case "a" b"b": pass
    case x if: pass
    case a, a: pass
    case {"k": 1, "k": 2}: pass
    case x, y: pass
    case x: pass
    case _: pass
    case 1: pass
    pass
case 1: pass
print x
print "a" % b
exec "x"
exec x in y
x == 1 = 2
x + 1 = 2
f() = 1
1 = x
"a" = 1
None = 1
True = x
x = = 1
x =
= x
x += y += 1
x, y += 1
(x) += 1
f() += 1
[x] += 1
x: int: str
x: = 1
x, y: int
(x, y): int = 1
[x]: int
f(): int
x: int = yield
x: int, str = 1
x := 1
(x := 1)
(x.y := 1)
(x := y := 1)
f(x := 1, y=(z := 2), w := 3)
*x
*x = 1
*x, *y = 1
(*x)
[*x, *y] = z
*x, = y
{**x}
**x
__debug__ = 1
x = yield = 1
x if y
x if y else
lambda: yield
lambda x
lambda x=: 1
lambda *: 1
lambda (x): 1
not
x not y
x is not
x in
x and
or x
x <
x..y
x.1
x.
.x
x[
x[]
x[1:2:3:4]
x(
x(,)
x(1, , 2)
x(a=1, 2)
x(**a, *b)
x(**a, b)
x(a=1, a=2)
x(1=2)
x(a.b=2)
x(f()=2)
x(None=1)
x(a for a in b, c)
x(c, a for a in b)
x(*)
x(**)
(
)
(]
[)
{]
(x, y
[x, y
{x: y
{x: y, z}
{x, y: z}
{x: }
{: x}
{**x, y}
{*x: y}
{x: *y}
[x for]
[x for y]
[x for y in]
[for x in y]
[x for x in y if]
[x, y for x in y]
[*x for x in y]
{**x for x in y}
{x: y for x, y in z, w}
(x for x in y for)
[x async for]
[x for 1 in y]
[x for f() in y]
[x if y for x in z]
[x := 1 for x in y]
[y for x in (y := z)]
await
await = 1
x = await
1 2
"a" x
x "a"
x y z
a b = 1
x;;y
;
x; ;
x \ y
x = 1 \
?
$
x!
!x
x ! y
a = 1 if 2 else
a <> b
a -> b
0x
1_
"unclosed
'
'''
swallowed'''
    indented = 1
  odd
def f():
pass
def g():
# nothing
class D:
if x:
for y in z:
while w: 
with v:
try:
    pass
x = 1
try:
    pass
finally:
    pass
else:
    pass
try:
    pass
except:
    pass
except x:
    pass
if x:
    pass
else:
    pass
elif y:
    pass
for x in y:
    pass
elif z:
    pass
@decorator
class E: pass
@decorator
async def h(): await x; return
@decorator

@decorator
# comment
x = 1
