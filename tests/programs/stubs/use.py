import pkg
import pkg._late as late, pkg._new
from pkg import Shape, VERSION, compute, read, write, unknown_name
from pkg._late import Late
import space.one, space.two as two
import only_stub
import numpy as np
shape = Shape()
areas = shape.area(), shape.area(1.5), shape.width, shape.name, shape.only_here()
shape.width = 3
lazy = pkg.lazy().late().s(), late.Late, pkg._new.read("x"), compute(2), read("x"), write(1), unknown_name, VERSION
spaces = space.one.x, two.y, only_stub.f(), np.array
class Square(Shape):
    def area(self, scale=2): return super().area(scale)
Square().area(1)
