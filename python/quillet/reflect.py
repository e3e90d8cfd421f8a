"""What the analysis does with an exception that is no answer: it is reported, and never shown.

Reports go to the logger "quillet", so a host hears of them where it hears of everything else.
"""

from __future__ import annotations

import logging
from types import TracebackType
from typing import NoReturn

__all__ = ["RaiseWithTraceback", "ReportCurrentException"]

_logger = logging.getLogger("quillet")


def ReportCurrentException(suppress_gui: bool = False) -> None:
    """Logs the exception that is being handled, with its traceback.

    With `suppress_gui` it is not to be shown to a user: it is logged as a warning and not as an error.
    """
    level = logging.WARNING if suppress_gui else logging.ERROR
    _logger.log(level, "An exception was reported", exc_info=True)


def RaiseWithTraceback(exc: BaseException, tb: TracebackType | None) -> NoReturn:
    """Raises `exc` with the given traceback."""
    raise exc.with_traceback(tb)
