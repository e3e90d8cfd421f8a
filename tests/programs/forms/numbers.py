numbers = [0, 00, 1_000, 0xFF_FF, 0b1_0, 0o1_7, 1., .5, 1e10, 1E-5, 1_0.0_1e+1_0, 1j, 1.5J, 0x, 0b2, 0o8, 1__0, 1_, 0_7, 077, 0xg, 1e, 1e+, 1.2.3, 1a, 0b1and 1, 1if 1else 2, 0or 1, 1in [], 9999999999999999999999999, 1_000.real, 1..real, 1.e1.real, 0X1f, 0B1, 0O7, 1L, 0777L, 0xFFl]
operators = +1 - -2 ** -3 * ~4 // 5 % 6 @ 7 << 8 >> 9 & 10 | 11 ^ 12, not 1 < 2 <= 3 == 4 != 5 >= 6 > 7, 1 in [] not in [] is None is not True and 1 or 0
a = b = 1; a += 1; a -= 1; a *= 2; a /= 2; a //= 2; a %= 2; a **= 2; a @= 2; a &= 1; a |= 1; a ^= 1; a <<= 1; a >>= 1
a[1:2], a[:], a[1:], a[:2:3], a[::], a[1, 2:3], a[...], a[()], a[b:=1], a[*b], a[1:2, *b, c]
a.b.c[d](e)(f).g, (yield), (yield a), (yield from b), await c, lambda: 0, lambda *, a: a, lambda a, /, b=1, *c, d, **e: (a, b)
x if y else z if w else v, [*a, *b], {*a, *b}, {**a, "b": 1, **c}, (*a,), *a, f(*a, **b), f(a for a in b), f(a := 1)
a <> b, a ! b, a ? b, $a, `a`, a..b, a->b, a++b, ++a, a--, a===b, a=:b, a!==b, a&&b, !a
[x for x in y for z in w if a if b], {x: y for x, y in z}, {x for x in y}, [x async for x in y], [(a, b) for a, *b in c], [x for x, in y]
