"""What the server can do, by the method of the protocol: filled by the modules that answer, read once by the server."""

from __future__ import annotations

from collections.abc import Callable
from typing import Any, NamedTuple, TypeVar

Answer = TypeVar("Answer", bound=Callable[..., Any])


class Feature(NamedTuple):
    """What answers a method, and what the client is told of it."""

    answer: Callable[..., Any]
    options: Any


FEATURES: dict[str, Feature] = {}


def feature(method: str, options: Any = None) -> Callable[[Answer], Answer]:
    """Makes a function of the server and parameters the answer to a method."""

    def keep(answer: Answer) -> Answer:
        FEATURES[method] = Feature(answer, options)
        return answer

    return keep
