f'{a.b!r:{w}}{c=}' f"{d['k']}"

f'{f"{a}{f'{b}'}"} {c}'

f'{x for x in y}'.z

f'{[x for x in y]}'

def f(): return f'{(lambda x: x)(y)}'

x = '{a}' + rb'{b}'

t'{a}' + T

(t#{a}
'{b}' + t\
'{c}')

x: 'List[a.B]' = y

def f(a: 'A', b='B') -> 'C': pass

cast('A', b)

x: Literal['a'] = 'b c'

x: 'no type at all'

x = []  # type: List[a.B]

def f(a,  # type: A
      b):
  # type: (...) -> C
  pass

class K:
  def f(self, a):  # type: (int) -> K
    pass

x = 1  # type: ignore[attr]
y = 2  # type: the kind of thing

f([x  # type: T
 for x in y])

