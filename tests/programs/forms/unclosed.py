def f(:
  x = [1,

def g(a, b:
    return {a: b

class C
  def m(self)
    pass
x = """never
closed
