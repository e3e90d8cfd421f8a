import sys
if sys.version_info < (3,):
    from ._old import read
elif sys.version_info[0] >= 3 and sys.version_info >= (3, 8):
    from ._new import read, write
try:
    from ._fast import compute
except ImportError:
    from ._slow import compute
def lazy():
    """Documented in the source."""
    from . import _late
    return _late.Late()
class Shape:
    """A shape."""
    def area(self, scale=1):
        """Its area."""
        return 0
    def only_here(self): return 1
