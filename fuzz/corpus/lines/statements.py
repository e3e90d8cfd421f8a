# c
def f(a: "T", b=lambda: 1): x = 1; return 2 # tr

if x: a; b
x;;y;
;
async def g(): pass
async with a as b: pass
if x: ;
class A: pass; # end
foo(a,
    b
def h():
  return (1,
x = 1
import y
match x:
  case [a]: pass
  case[a]: int = 3
  case (1): foo()
match = 1
x: int
lambda: 0
lambda x=1: 0
f(lambda: 0)[1] = 3
type X = int
type X[T] = "a"
type(x)
print(x)
"doc" 'b'
"doc" % 3
y = cast("T", x)
x = "a"
z = f"a{b}"
s = 'abc
t = """abc
def rest(): pass
x = 1 \
  + 2; y = """a
b"""
q = $ ? ! é
