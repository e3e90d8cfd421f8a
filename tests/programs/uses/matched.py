# What patterns bind.
from dataclasses import dataclass
from enum import Enum
from typing import Union


class Kind(Enum):
    LOUD = "loud"
    QUIET = "quiet"


@dataclass
class Point:
    x: int
    y: str


class Named:
    __match_args__ = ("name", "size")

    def __init__(self, name: str, size: int):
        self.name = name
        self.size = size


class Plain:
    value = b""


def whole(subject: Union[Point, Named, Plain, str, list[int], dict[str, Point], tuple[int, str], None]):
    match subject:
        case Point(x, y):
            x.real
            y.upper
            subject.x
        case Point(x=a, y="b" as b):
            a.real
            b.upper
        case Named(name, size):
            name.upper
            size.real
        case Named(size=size):
            size.real
        case Plain(value=value) as plain:
            value.decode
            plain.value
        case Plain(one):
            one
        case str(text):
            text.upper
        case int() | str() as either:
            either
        case [first, *rest]:
            first.real
            rest[0].real
        case (first, second):
            first.real
            second.upper
        case [Point(x=x), _]:
            x
        case {"key": point, **others}:
            point.x
            others["a"].y
        case {"key": {"inner": inner}}:
            inner
        case Kind.LOUD:
            subject.name
        case -1 | 2.5 | 1 + 2j | "a" "b" | b"" | True:
            subject
        case None:
            subject
        case (x):
            x
    match subject, 1:
        case Point() as one, two:
            one.x
            two.real
        case other:
            other[1].real


def guarded(x: Union[int, str]):
    match x:
        case int() if x > 1:
            return x
        case str() as y if y.upper():
            return y
        case z if z:
            return z
        case _:
            return None


def of_kinds(kind: Kind):
    match kind:
        case Kind.LOUD:
            return 1
        case Kind.QUIET:
            return ""


guarded(1)
of_kinds(Kind.LOUD)
