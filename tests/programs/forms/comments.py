# region imports
import a
# comment
# of lines
from b import (c,  # type: ignore
               d)
# endregion
x = 1  # type: int
y = []  # type: List[str] # more
z = w = None  # type: Optional[Dict[str, "A"]]
(p, q), r = v  # type: (int, str), bool
with f() as g:  # type: int
    pass
for i, j in k:  # type: int, str
    #: about it
    s = 1
    t = 2  #: behind
    """Attribute docs."""


class A:
    """Summary.

    Attributes:
        one: first
        two (int): second

    :ivar three: third
    :vartype three: str
    """
    one = None  # type: ignore[attr]

    # type: (int) -> not here
    def m(self, a, *b, **c):
        # type: (int, *str, **bool) -> Dict[str, int]
        return a

    def n(self,
          a,  # type: int
          b=1,  # type: "str"
          **c  # type: Any
          ):
        # type: (...) -> None
        pass

    def doc(self, a, b, c, d=1):
        """Sums.

        @param a: first
        @type a: int
        @return: nothing
        @rtype: list of str

        Parameters
        ----------
        b : {'x', 'y'}, optional
            second
        c : array_like or None

        Returns
        -------
        result : dict
            of things

        Yields:
            int: x

        Raises:
            ValueError: if
        """
    def rest(self, x):
        r'''Rest.

        :param int x: number
        :param y: other
        :return: what
        :rtype: :class:`A` or None
        >>> A().rest(1)
        '''
        return x


def broken(a):  # type: (int -> str
    pass
u = 1  # type:
v = 2  # type: int = 3
u: int  # noqa
def one(a): return a  # type: ignore
# type: int
lonely = 1
#!shebang
# -*- not coding: here
if x: # x
    pass # y
  # z
else: # w
    pass
	# tab
# last
