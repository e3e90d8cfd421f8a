[x + y for x in z if w]

{k: v for k, v.a in z for b in k}

f(x async for x in y)

[[a for a in b] for b in c]

[lambda: x for x in y]

(x for x in [y for y in z])

class A:
  b = 1
  [b for _ in b]

def f():
  [[y := x for x in z] for z in w]
  y

[y := x for x in z]

[lambda: (y := x) for x in z]

