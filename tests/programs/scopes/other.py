from .names import outer, Outer
from . import names
shared = names.outer
def hidden(): return names.counter
class Shared(Outer, names.Outer.Inner):
    attribute = "text"
    def method(self): return super().method() or super(Shared, self).prop
    def new(self): self.attribute = 1; self.fresh = Shared(); return self.fresh.method()
_private = __private = 1
if shared:
    try:
        from missing import something
    except ImportError:
        something = None
elif hidden:
    something = 1
