#!/usr/bin/python2
# -*- coding: utf-8 -*-
"""What only Python 2 reads."""
from __future__ import division, with_statement
import os, sys
import cPickle as pickle, urllib2
from helpers import *
from helpers import Old, make as made
import package.sub.deep
import package.sub as sub
from package import sub as other, missing

print
print "a", 1,
print >>sys.stderr, "error: %s" % `made`, u"text", ur"raw\n", br"bytes", b'x', R"y"
print("one"), ("two", 3)
exec "x = 1" in globals(), {}
exec "y = 2"
exec("z = 3", {}, {})
n = 0777 + 0xFFL + 10L + 0b11 + 0o17 + 1e5j + .5
if n <> 3: raise ValueError, "message"
try:
    raise KeyError, "a", None
except (KeyError, ValueError), (first, second):
    print first
except Old, error: print error.args[0]
except: raise


class Classic:
    x = 1
    def method(self, (a, b), c=(1, 2), *args, **kw):
        return a, b, self.x
    def __cmp__(self, other): return cmp(self.x, other.x)
    def __nonzero__(self): return True
    def __getslice__(self, i, j): return [i, j]
    __metaclass__ = type


class New(object, Old):
    def __init__(self): super(New, self).__init__(); self.items = {}.iteritems()
    next = lambda self, (x, (y, z)): x + z


def generator(xs):
    # type: (List[int]) -> Iterator[str]
    """Yields.

    >>> list(generator([1]))
    """
    for x in xs, ys: yield x
    for y in 1, 2: pass
    print [x for x in 1, 2, 3 if lambda: x], x, {a: b for a, b in xs}, {a for a in xs}
    assert isinstance(x, (str, unicode, basestring, long)), `x`
    with open("a") as f, open("b"): print >> f, "x" ; print >>f
    return


def typed(a,  # type: int
          b=None,  # type: str
          *args  # type: bool
          ):
    # type: (...) -> int
    value = []  # type: List[str]
    for i in value:  # type: str
        pass
    with made() as m:  # type: Old
        pass
    return i, m
True = 1
None = 2
print typed(1)[0], Classic().method((1, 2)), New().items, Old().value, package.sub.deep.found, other.deep, raw_input(), xrange(3)
nonlocal = async = await = match = print_ = 1
def f(): global nonlocal; exec "a" in {}; from helpers import *
backquoted = `1, n`
assert (1, "always")
