a = 1
if a:
    b = """x
y"""
    c = (1,
  2)

def f(x,  # type: int
      ):
    # type: (...) -> str
    return x \
  + 1
