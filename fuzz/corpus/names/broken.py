class A:
  def add(self, item, count=1)
    self.items(item)
  x = 1

def f a, b:
  a

def f(a, b.c, d e):
  a

class (B):
  x = 1

def
class
def class x

public def f(a):
  a

f(a.b(c = 
x = 1

if x = 3:

a b = c d

x = = y.

.a.b

) a ] b = c

for in x: y
for a b: c

import a. as b c
from x impor y

global x = y

lambda x
lambda: 
(lambda x, y=

[x for x

with a as
del
del a, (b) = c
del a as b = c.d = e
return return x

def f(x:
  y
def g(): x

def f(x):
  y = (x
  return y

