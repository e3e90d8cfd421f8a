"""What a test tells about a name."""
import sys
from typing import Any, Callable, Literal, TypeGuard, TypeIs, Union


class Leaf:
    kind: Literal["leaf"] = "leaf"
    value = 1


class Node:
    kind: Literal["node"] = "node"

    def __init__(self, left: "Tree", right: "Tree | None" = None):
        self.left = left
        self.right = right


Tree = Union[Leaf, Node, None]


def is_leaf(tree: Tree) -> TypeGuard[Leaf]:
    return type(tree) is Leaf


def is_number(value: object) -> TypeIs[int | float]:
    return isinstance(value, (int, float))


def sums(tree: Tree) -> int:
    if tree is None:
        return 0
    if isinstance(tree, Leaf):
        return tree.value
    if tree.right is None:
        return sums(tree.left)
    while tree.right is not None and not isinstance(tree.right, Leaf):
        tree = tree.right
    return sums(tree.left) + sums(tree.right)


def by_kind(tree: Leaf | Node):
    if tree.kind == "leaf":
        return tree.value
    return tree.left


def guarded(tree: Tree, other: object):
    if is_leaf(tree):
        value = tree
    else:
        value = other
    if not is_number(other):
        return other
    both = value, other
    return both


def by_truth(text: str | None, number: int | None = None, *, anything: Any = None):
    first = text or "empty"
    second = text and text.upper()
    third = number if number is not None else 0
    fourth = not text
    if not text:
        text = "none"
    if (n := number) is not None and n > 3:
        fifth = n
    elif isinstance(number, int) or text == "x":
        fifth = number, text
    else:
        fifth = None
    if callable(anything):
        sixth = anything
    elif hasattr(anything, "name"):
        sixth = anything.name
    else:
        sixth = ()
    return first, second, third, fourth, fifth, sixth


def by_class(value: int | str | list[int] | tuple[str, int] | type[int] | Callable[[], int]):
    if issubclass(type(value), int):
        return value
    if isinstance(value, str | bytes):
        found = value
    elif type(value) == list:
        found = value[0]
    elif isinstance(value, tuple) and len(value) == 2:
        found, _ = value
    elif isinstance(value, type):
        found = value()
    else:
        found = value()
    if value in (1, 2, 3):
        equal = value
    elif value != "x":
        equal = value
    return found, equal


def by_match(subject: Leaf | Node | dict | list | str | int | None, flag: bool):
    match subject:
        case None:
            found = 0
        case Leaf(value=1 | 2 as small):
            found = small
        case Node(left=Leaf() as leaf, right=right) if right is not None:
            found = leaf, right
        case Node(left):
            found = left
        case {"key": value, "other": [first, *rest], **more}:
            found = value, first, rest, more
        case {}:
            found = {}
        case [1, -2.5, "text", b"bytes", 3 + 4j, True]:
            found = 1
        case (first,) | [_, first]:
            found = first
        case [first, (second, *_), *others]:
            found = first, second, others
        case sys.maxsize | sys.platform:
            found = subject
        case "a" "b" | str():
            found = subject
        case int(number) if flag:
            found = number
        case _:
            found = subject
    match flag, subject:
        case True, other:
            return other
        case (False, (None | 0)):
            pass
        case both:
            found = both
    return found


def asserted(value: "int | None", other=None):
    assert value is not None, "value"
    assert isinstance(other, str)
    del value
    value = other
    return value
