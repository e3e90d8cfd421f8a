"""What the server writes down where it is told to, and nowhere else.

Loading `logging` takes as long as an answer, and most servers have no log.
"""

from __future__ import annotations

TYPE_CHECKING = False
if TYPE_CHECKING:
    from logging import Logger

_logger: Logger | None = None


def write_to(path: str) -> None:
    """Writes to the end of a file from now on, what libraries warn of as well."""
    global _logger
    import logging

    logging.basicConfig(
        filename=path, level=logging.INFO, format="%(asctime)s %(levelname)s %(name)s: %(message)s", force=True
    )
    logging.getLogger("pygls").setLevel(logging.WARNING)
    _logger = logging.getLogger("quillet.server")


def is_written() -> bool:
    """Whether there is a log."""
    return _logger is not None


def info(text: str, *values: object) -> None:
    """What is done."""
    if _logger is not None:
        _logger.info(text, *values)


def warning(text: str, *values: object) -> None:
    """What is odd."""
    if _logger is not None:
        _logger.warning(text, *values)


def exception(text: str, *values: object) -> None:
    """With the exception that is being handled."""
    if _logger is not None:
        _logger.exception(text, *values)
