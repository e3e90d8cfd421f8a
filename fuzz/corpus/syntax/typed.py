x.
return x.
self.is
x = 
for x in 
with open(p) as 
import a.
from a.
from a import 
from . import (a, 
class C(
def f(a:
  x = foo(bar,
  self.y = 3
  if foo(
    return 1
  z = {a: , b
x y z
if x y:
  z
else if x:
  y
x = return y
) x
$
= 1
@a
x
@b
def
f(a.b=1, [b, c)
lambda x
f'{a.}{'
match x:
  case C(
