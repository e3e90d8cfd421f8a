"""Where control goes."""
import os
from contextlib import contextmanager, suppress
from typing import NoReturn


def fail(message) -> NoReturn:
    raise SystemExit(message)


def tried(path):
    try:
        file = open(path)
    except FileNotFoundError:
        return None
    except (OSError, ValueError) as error:
        result = error.args
        raise RuntimeError("no") from error
    except Exception:
        result = 1
        raise
    else:
        result = "fine"
    finally:
        done = True
    return result, done, file


def nested_tries():
    value = None
    try:
        try:
            value = 1
        finally:
            value = "one"
    except BaseException as e:
        value = 2.0
        fail(e)
    except:
        pass
    return value


def looped(items: list[int], stop=3):
    found = None
    for i, item in enumerate(items):
        if item == stop:
            found = item
            break
        elif item < 0:
            continue
        last = item
    else:
        found = "all"
        i = None
    while True:
        if found:
            break
        found = last
    else:
        never = 1
    while stop:
        stop -= 1
        try:
            continue
        finally:
            stop = stop - 1
    for found.attribute in items:
        pass
    for items[0], *rest in [(1, 2), (3, 4)]:
        print(rest)
    return found, i, stop


@contextmanager
def opened(name: str):
    yield name.upper()


def with_all():
    with opened("a") as first, suppress(KeyError):
        value = first
    with (opened("b") as second, opened("c") as (third, fourth),):
        value = second
    with opened("d"):
        pass
    with open(os.devnull) as f, f as g: return value, g
    return third, fourth


def branches(flag, other=None):
    if flag:
        name = 1
    elif other:
        name = "two"
    elif flag is other:
        raise ValueError
    else:
        fail("x")
    if other:
        maybe = 3
    before = name
    name = [name]
    return maybe, before, name


def jumps(x):
    if x: return 1; y = 2
    while x: x -= 1; break
    else: x = None
    for _ in x: pass
    if not x: pass
    else: return x
    try: x = 1
    except A: x = 2
    else: x = 3
    finally: x = 4
    with x as z: pass
    return z


def generators(n):
    total = yield
    got = yield total, n
    other = (yield)
    back = yield from generators(n - 1)
    squares = (i * i for i in range(n) if i % 2 if i > 3)
    return [x async for x in back], got, other, squares


def deleted():
    a = b = c = 1
    del a, (b, [c])
    try:
        return a
    finally:
        del b
