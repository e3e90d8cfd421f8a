match x:
  case [a]: pass
  case[a]: int = 3
  case x if lambda: y: z
match.x: int
case(x).y: int
match lambda: x:
async def f(): # type: () -> int
    return (
  async def g(): pass
foo(
async with x: pass