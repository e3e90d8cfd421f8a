"""What methods are that classes below fill in, and what functions are called with."""
from abc import ABC, abstractmethod


class Shape(ABC):
    @abstractmethod
    def area(self): ...
    def name(self): raise NotImplementedError
    def corners(self): pass
    @property
    def colour(self): raise NotImplementedError("colour")
    def describe(self): return self.name(), self.area(), self.corners(), self.colour, self.only_below, self.registered
    def scaled(self, factor): return type(self)(factor), self.__class__(factor), factor
    @classmethod
    def create(cls, *args): return cls(*args)
    def __init_subclass__(cls, **kw): cls.registered = kw


class Square(Shape):
    only_below = 1
    def __init__(self, side=1): self.side = side
    def area(self): return self.side ** 2
    def name(self): return "square"
    def corners(self): return [(0, self.side)]
    @property
    def colour(self): return "red"


class Circle(Shape, kind="round"):
    def __init__(self, radius): self.radius = radius; super().__init__()
    def area(self): return 3.14 * self.radius
    def name(self): return super().name() or b"circle"


class Odd(Square, Circle):
    def area(self): return super(Square, self).area(), Circle.area(self), super().corners()
    def corners(self): return Shape.corners(self)


def use(shape, *more, scale=None, **named):
    for each in more: each.area()
    for key, value in named.items(): value.name()
    shape.area(), scale.side
    return shape
def passes(f, x): return f(x)
def back(callback=lambda x: x): return callback(1), callback
def late(x): return x.area
def wants(square: Square, text): return text.upper()
class Client:
    def __init__(self, shape, factory=None): self.shape = shape; self.factory = factory; self.made = factory()
    def go(self): return self.shape.area(), self.made.name(), self.factory
    def on(self, event, handler): handler(event, self)
    def handle(self, event, client): return event.side, client.go


used = use(Square(), Circle(1), Odd(), scale=Square(2), extra=Circle(2)), passes(Square, 3).side, passes(late, Odd()), back(), back(lambda s: Square(s))
client = Client(Square(), factory=Circle); client.go(); client.on(Square(), client.handle); Client(shape=Odd(), factory=lambda: Square()).go()
wants(Square(), "a"); wants(text="b", square=Odd()); Odd().describe()[0]; Square(2).scaled(3)[0].side; Shape.create().area(); Circle.create(1).radius; Odd.create().side
def decorated(*shapes):
    def inner(f):
        def wrapped(self, *args): return f(self, shapes[0], *args)
        return wrapped
    return inner
class Uses:
    @decorated(Square())
    def run(self, shape, more=None): return shape.area(), more
    x = property(lambda self: Square(), lambda self, v: None, doc="X")
    def _get(self): return 1
    def _set(self, v): self.v = v
    y = property(_get, _set)
    z = property(fget=_get)
    lazily = None
    def lazy(self):
        if self.lazily is None: self.lazily = Square()
        return self.lazily
Uses().run(1), Uses().x.side, Uses().y, Uses().z, Uses().lazy().side, Uses.x
