def f():
  x
  global x, y
  x = y

def f():
  x = 1
  def g():
    nonlocal x
    x = 2

def f(a, /, b: T = d, *c: U, e=a, **k) -> R: return a

async def f(*, a):
  await a

@a.b(c)
@d
def f(): pass

def f(a=lambda b=c: b, d=1): pass

def f(a: lambda x: x, b): pass

class A(B, c.D[T], *E, metaclass=M, **k): pass

class A(f(x), k=v):
  y = A

class A:
  x = 1
  def f(self): x

f(lambda x, *y, z=w: x + z, v)

{lambda: a: b}

x[lambda: a: lambda: b]

(lambda: lambda x: x).y

def f[T: B = D, *Ts, **P](x: T = y) -> T: T

class A[T](B[T], k=v): x: T

type X[T] = L[T]
type Y = X
type(x)
type = 3

class C:
  x = 1
  def f[T: x](a: x): x
  type Y = x

class _A:
  __x = 1
  def __f(self, __y__): return self.__x + __x

class __:
  __x = 1

def f(x):
  class C:
    x = 1
    def g():
      def h(): return x

class A:
  def f(self): super().f()
def g(): __class__

def f():
  global x
  def x(): pass

@d
class A:
  def f(self):
    return [x
      for x in y]

# end
z

