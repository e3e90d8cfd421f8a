"""A shop: what it sells, who buys, and what that costs."""

from .goods import *
from .goods import Book as _Book, Good as Article
from . import orders, errors as problems
from .orders import Order, total_of

__all__ = ["Good", "Order", "Article"]
__all__ += ["total_of"]
__all__.append("orders")
__all__.extend(problems.__all__)
__version__ = "1.2"


def __getattr__(name: str) -> object:
    if name == "Book":
        return _Book
    raise AttributeError(name)
