match x:
  case C(
f f(a,  # type: int
      (b, (c,))=1): pass
