"""What the server can do, by the method of the protocol: filled by the modules that answer, read once by the server."""

from __future__ import annotations

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable
    from typing import Any, TypeVar

    Answer = TypeVar("Answer", bound=Callable[..., Any])

# What answers a method.
FEATURES: dict[str, Callable[..., Any]] = {}
# What clients are told of it, as `initialize` has it.
PROVIDERS: dict[str, Any] = {}


def feature(method: str, provider: str | None = None, options: Any = True) -> Callable[[Answer], Answer]:
    """Makes a function of the server and parameters the answer to a method, of which the client is told by the name
    and the options of a provider, where it has one.
    """

    def keep(answer: Answer) -> Answer:
        FEATURES[method] = answer
        if provider is not None:
            PROVIDERS[provider] = options
        return answer

    return keep
