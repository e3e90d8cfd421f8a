from __future__ import annotations
class A:
    x: T = [i for i in y]
    y: (lambda q: q)
    def f(self, a: A, b: [k for k in z] = 1) -> (lambda: a): 
        v: Loc = 1
        w: Loc2
        def g(): return v, w
        return __class__
    __p: __q
z: __m = 1
