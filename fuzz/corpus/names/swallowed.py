class B(
  def kept(self): pass
  x = (1,
   y)
z

class B(A:
	async def kept(self,
	@d
	def other(self,
	  a) -> R: self
	class C: c

f(x, [y, \
  z
  class A:
    z = {a
  def g(): return [z for z in y
    async
  def h(): case
class D: f

def f[T: (
class E[__T](__T: def g(): __x
