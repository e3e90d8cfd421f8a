print >>x, y,
print >>
print >>x y
print x,, y
exec
exec x in
exec x in y, z, w
raise x, y from z
except x, : pass
`x
`x y`
``
0777 + 0xFFL + 0o18 + 09
ur"a" u"b" ub"c"
x <> y <> z
def f((a, b)=(1, 2), (c,), ((d))): pass
def f((a, a)): pass
def f((a.b)): pass
lambda (a, b): a
print(x, file=y)
print x if y else z, lambda: 1
print
from __future__ import print_function
print x
print(x, file=y)
async def f(): pass
nonlocal x
def f(*, a): pass
def f(a: int) -> int: pass
x: int = 1
f"x" b"y"
class C(metaclass=M): pass
raise x from y
{**a}; [*a]; *a, b = c; a @ b; yield from x; 1_000
import x.y as z, w; from . import *; from .a import (b)
with (a as b, c): pass
match x:
    case 1: pass
True, False = 1, 0
None = 1
as = with = 1
for x in 1, 2: pass
[x for x in 1, 2]
[x for x in lambda: y, z]
exec = 1
exec("x")
print = 1
return x
def g(): return 1; yield
def h():
    exec "x"
    from a import *
    def i(): return x
def tab():
	x = 1
        y = 2
