print >>f, a
print(b)
exec c in d, e

from __future__ import print_function
print(b)

try: pass
except E, e: raise F, v, t
except (A, B), (c, d): pass

def f(a, (b, (c, d))=e): pass
lambda (x, y): x

[x for x in y]
set(x for x in y)

[x() for x in lambda: a, lambda: b if x()]

x = `a.b` <> None
async = nonlocal

async = await

async def f():
  await x
  [a async for a in b]

await x

