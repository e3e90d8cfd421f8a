from . import one; y = one.x
