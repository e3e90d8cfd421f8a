import deep
from . import deep as again
from .. import missing_too
from deep import found
