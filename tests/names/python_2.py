class A:
    __p = [__q for __q in x if __q]
    def f(self, (a, (b, __c)), d=lambda (e, f), g=1: e): 
        print >>sys.stderr, a, b
        exec code in ns, d
        print a, `b`
        raise E, "x", tb
        return (x for x in a), [y for y in a if lambda: y], {k: v for k in b}, {k for k in b}
    def g(self):
        try: pass
        except E, (e, f): pass
        except (E1, E2), g.h: pass
        exec "x"
        from os import *
def h():
    def k(): return x
    global y
    y = None, True
    x = 1
    return x <> y, 0777, a[::], a[:], a[b::c, ...]
nonlocal = as_ = 1
with a as b, c as (d, e): pass
print
print (a), b
