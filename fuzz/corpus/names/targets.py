del a, (b = c), d = e as g = h
for a = b, c as d in e = f: del g = h
with a as b = c, d as (e = f: g
except a, b = c, d: e
if a for b = c in d = e: f
assert a as (b, c) = d += e
[a for b = c in d = e if f = g]
(a as b = c for d in e as f)
@a = b
return a = b.c = (d) = e
case a = b if c = d: e = f
x = y: z = w: v
del lambda: a = b, c += d
lambda a, (b = c, d): e = f
