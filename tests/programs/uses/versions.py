# What the version and the system decide, and what they do not.
import os
import sys
import typing
import typing as t
from sys import version_info
from typing import TYPE_CHECKING

import six

if sys.version_info >= (3, 8):
    first = 1
elif sys.version_info >= (3,):
    first = 1.5
else:
    first = "1"

if sys.version_info < (3, 0, 0):
    from two import only as second
else:
    second = b"2"

if sys.version_info[:2] == (3, 12):
    third = [3]
else:
    third = (3,)

if sys.version_info[:2] != (3, 12):
    third_again = [3]
else:
    third_again = (3,)

if sys.version_info[0] <= 2:
    fourth = {4: 4}
else:
    fourth = {4}

if sys.version_info.major > 3:
    fifth = 5
else:
    fifth = "5"

if version_info <= (3, 11):
    sixth = 6
else:
    sixth = "6"

if version_info >= wanted:
    unknown = 1
else:
    unknown = "1"

if sys.version_info >= (3, x):
    unknown_part = 1
else:
    unknown_part = "1"

if sys.platform == "win32":
    seventh = 7
elif sys.platform.startswith("darwin"):
    seventh = 7.5
elif sys.platform.startswith("lin"):
    seventh = "7"
else:
    seventh = None

if sys.platform != "linux":
    eighth = 8
else:
    eighth = "8"

if os.name == "posix":
    ninth = 9
else:
    ninth = "9"

if os.name in names:
    tenth = 10
else:
    tenth = "10"

if six.PY2:
    eleventh = 11
else:
    eleventh = "11"

if not six.PY3:
    twelfth = 12
else:
    twelfth = "12"

if TYPE_CHECKING:
    thirteenth = 13
else:
    thirteenth = "13"

if typing.TYPE_CHECKING or t.TYPE_CHECKING:
    fourteenth = 14
else:
    fourteenth = "14"

if 0:
    fifteenth = 15
elif 0.0:
    fifteenth = 15.5
elif True:
    fifteenth = "15"
else:
    fifteenth = None

if 1 > 2:
    sixteenth = 16
else:
    sixteenth = "16"

if "a" == "a":
    seventeenth = 17
else:
    seventeenth = "17"


def a_function():
    return 1


if a_function:
    eighteenth = 18
else:
    eighteenth = "18"

if a_function is a_function:
    nineteenth = 19
else:
    nineteenth = "19"

if a_function != a_function:
    twentieth = 20
else:
    twentieth = "20"

all_of_them = (first, second, third, third_again, fourth, fifth, sixth, unknown, unknown_part, seventh, eighth, ninth)
the_others = (tenth, eleventh, twelfth, thirteenth, fourteenth, fifteenth, sixteenth, seventeenth, eighteenth)
last = (nineteenth, twentieth)


class Depending:
    if sys.version_info >= (3,):

        def shown(self):
            return "three"

        text = ""
    else:

        def shown(self):
            return 2

        text = b""

    if sys.version_info > (4,):
        never = 1

    try:
        import fast as how
    except ImportError:
        import slow as how


Depending().shown()
Depending.text
Depending.never
Depending().how
