# How statements are left, and what is known behind them.
import contextlib
import os
import sys
from typing import NoReturn, Optional, Union


class Cat:
    lives = 9
    kind = "cat"

    def purr(self):
        return self


class Dog:
    tricks = ["sit"]
    kind = "dog"


def fails(message) -> NoReturn:
    raise ValueError(message)


def may_fail(x):
    if x:
        fails("x")
    return 1


def always_fails():
    raise SystemExit(1)


def one(x: Union[Cat, Dog, None]):
    if x is None:
        return 1
    x.kind
    if isinstance(x, Cat):
        x.lives
    else:
        x.tricks
    x.kind


def two(x: Optional[Cat]):
    if not x:
        fails("no x")
    x.lives
    while x is not None:
        x.lives
        x = None
    x


def three(x: Union[Cat, Dog, str, int]):
    if isinstance(x, (Cat, Dog)) and x.kind:
        x.kind
    elif isinstance(x, str):
        x.upper
    else:
        x
    if type(x) is Cat:
        x.lives
    if type(x) == Dog:
        x.tricks
    if callable(x):
        x()
    if not isinstance(x, str) or x.upper():
        x
    if isinstance(x, Cat) is True:
        x.lives
    assert isinstance(x, Dog), x
    x.tricks


def four():
    try:
        x = Cat()
    except ValueError as error:
        x = Dog()
        error.args
    except (KeyError, OSError) as errors:
        x = errors
        raise
    except:
        sys.exit(1)
    else:
        x.lives
    finally:
        x
    x.kind


def five(xs):
    for x in xs:
        if x:
            found = Cat()
            break
        continue
    else:
        found = Dog()
    found.kind
    for x in []:
        pass
    else:
        return found
    x


def six():
    while True:
        x = Cat()
        if x.lives:
            break
        x = Dog()
    x.lives
    while 1:
        y = Dog()
        return y
    y


def seven(x=None):
    x = x or Cat()
    x.lives
    y = x and Dog()
    y.tricks
    z = x if x else Dog()
    z.lives
    if (w := Cat()) and w.lives:
        w.lives
    return w.kind


def eight():
    with contextlib.suppress(ValueError):
        x = Cat()
        fails(x)
    with open("x") as file:
        return file
    x


def nine(x):
    if x == 1:
        y = Cat()
    elif x == 2:
        y = Dog()
    else:
        os._exit(1)
    y.kind
    if x:
        return
    else:
        raise KeyError(x)
    y.never


def ten(x: Union[Cat, Dog]):
    match x:
        case Cat(lives=9):
            x.lives
            return x
        case Dog():
            x.tricks
            y = x
        case _:
            raise ValueError
    y.tricks


def eleven(x: "Cat | Dog | None" = None):
    if hasattr(x, "lives"):
        x.lives
    if x is not None and x.kind == "cat":
        x.kind
    if x in (None,):
        return
    if x == None:
        return
    del x
    x


def twelve():
    global counted
    counted = Cat()

    def inner():
        nonlocal local
        local = Dog()
        return local

    local = None
    inner().tricks
    local.tricks
    return local


def thirteen(x):
    def unreached():
        return Dog()

    return Cat()
    return Dog()


def fourteen():
    try:
        return Cat()
    finally:
        print()


def fifteen():
    try:
        pass
    finally:
        return Dog()


def sixteen(x):
    for i in x:
        yield Cat()
    got = yield
    return Dog()


async def seventeen():
    async with eighteen() as x:
        x
    async for y in nineteen():
        y.lives
    z = await twenty()
    z.tricks
    [w.lives async for w in nineteen()]
    return z


async def nineteen():
    yield Cat()


async def twenty():
    return Dog()


def twenty_one():
    x = yield from sixteen([])
    x.tricks
    for y in sixteen([]):
        y.lives
    running = sixteen([])
    running.gi_frame
    running.send(1).lives
    coroutine = twenty()
    coroutine.cr_frame
    generator = nineteen()
    generator.ag_frame


counted.lives
nine(1).kind
thirteen(1).lives
fourteen().lives
fifteen().tricks
may_fail(1).real
always_fails()
