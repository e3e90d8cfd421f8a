a + b * -c ** -d - e
a < b + c is not d not in e or not f and g
a if b else c if d else lambda x, *y, z=1, **k: x if y else z
f(a, *b, c=d, **e).g[1:2, ::3, ...][x,](x for x in y)
(), (a), (a,), (a := b, c), [], [a, *b], {}, {a, *b}, {a: b, **c}
[x for x in y if a if lambda: b if c], {a for a in b}, {a: b for a, b in c async for d in e}
1, 0xE, 1e5, 2j, 3L, None, ..., b'', f'{a!r:{b}} {c=}' 'x', t'{a["x"]} {b}'
`a, b`
await a ** b, (yield), (yield from a)
