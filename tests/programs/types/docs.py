"""Types that only docstrings tell."""
import collections


class Item: value = 1


def sphinx(a, b, c, d, e, f, g, h, i):
    """Takes.

    :param int a: number
    :param b: text
    :type b: str or None
    :type c: list[Item]
    :type d: (int, str)
    :type e: dict of str to Item
    :type f: `Item`
    :type g: :class:`~docs.Item`
    :type h: collections.OrderedDict
    :type i: {'x', 'y'}
    :rtype: tuple(int, Item)
    """
    return a, b, c, d, e, f.value, g.value, h, i
def google(a, b=None, *args, **kwargs):
    """Takes.

    Args:
        a (int): first
            goes on
        b (Optional[Item]): second
        *args (str): more
        **kwargs: rest
    Returns:
        Item: what
    """
    return a, b.value, args[0], kwargs
def numpy(a, b, c, d, e=1):
    """Takes.

    Parameters
    ----------
    a : int
        first
    b, c : list of Item, optional
        others
    d : {1, 2}, default: 1
    e : array-like of shape (n,)

    Returns
    -------
    Item
        plain
    """
    return a, b[0], c, d, e
def numpy_named():
    """Gives.

    Returns
    -------
    first : str
    second : int
    """
def epy(a, b):
    """
    @type a: int
    @param b: x
    @type b: Item
    @rtype: C{list} of L{Item}
    """
    return b.value
def yields():
    """Makes.

    Yields:
        Item: each
    """
def odd(a, b, c): "One line. :type a: int :rtype: no such type"
def odd2(a, b): """:type a: int, str
    :type b: callable
    :rtype: iterable of (int, str)"""; return a
def odd3(x):
    """Args: x: y
    Returns: bool
    Raises: x
    """
class Fields:
    """Has.

    Attributes:
        one (int): first
        two: second
    Args:
        three (Item): third
    """
    def __init__(self, three): self.three = three.value; self.two = 2
    #: about four
    four = None
    """More about four."""
results = sphinx(1, "a", [], (), {}, Item(), Item(), 1, "x")[1], google(1), numpy(1, 2, 3, 4), numpy_named(), epy(1, 2), yields(), odd(1, 2, 3), odd2(1, 2), odd3(1), Fields(Item()).one, Fields(1).four
