import collections.abc
import use, uses_installed as ui
from use import shape as s, Square as Sq
from . import use as again
from .use import shape
from .. import outside
from ...far import away
__all__ = ["s", "Sq", "missing_name"] + ["ui"]
__all__.remove("ui")
def shadow(use): return use.shape, s.area(1), Sq().area(), ui.Mine().extra(), again, shape
