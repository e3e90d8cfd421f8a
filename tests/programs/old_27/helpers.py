from __future__ import print_function
import main
class Old:
    value = unicode(1)
    def __init__(self, *a): self.args = a
def make(x=None): print(x, file=None, end=""); return Old(x)
print(make, sep="")
_hidden = 1
