"""The options of `quillet find`, once for click and once for a person in a hurry.

click takes longer to load than the answer takes, so the plain form of a question (a name, known options
spelt out) is read here. Everything else goes to click: help, mistakes, completion, `--option=value`.
"""

from __future__ import annotations

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Sequence
    from typing import Any


class Option:
    """An option and the parameter that it sets: a flag, or with `metavar` or `choices` one that takes a value."""

    def __init__(
        self,
        flags: tuple[str, ...],
        parameter: str,
        text: str,
        *,
        metavar: str = "",
        choices: tuple[str, ...] = (),
        repeated: bool = False,
    ) -> None:
        self.flags = flags
        self.parameter = parameter
        self.help = text
        self.metavar = metavar
        self.choices = choices
        self.repeated = repeated

    @property
    def takes_value(self) -> bool:
        return bool(self.metavar or self.choices)

    @property
    def is_path(self) -> bool:
        return self.metavar in ("FILE", "DIR")

    @property
    def missing(self) -> object:
        """The value of the parameter where the option is not given."""
        return () if self.repeated else None if self.takes_value else False


ROLES = {
    "set": "Where it is set, also by += (parameters: --param).",
    "get": "Where it is read.",
    "call": "Where it is called.",
    "import": "Where it is imported; a module by its dotted name.",
    "param": "Where it is a parameter.",
    "hint": "Where it has a type hint.",
    "def": "Where a class, a function or a type of this name is defined.",
    "delete": "Where it is deleted.",
    "keyword": "Where an argument is passed by this keyword.",
    "decorator": "Where it decorates.",
    "base": "Where a class inherits from it.",
    "raise": "Where it is raised.",
    "annotation": "Where an annotation names it.",
}
INDEX_OPTION = Option(
    ("--index",),
    "index",
    "The index to ask; without it .quillet-index of this folder or the nearest one above.",
    metavar="FILE",
)
ROOT_OPTION = Option(
    ("--root",),
    "roots",
    "A folder outside of the index's own whose files are shown, too. May be given more than once.",
    metavar="DIR",
    repeated=True,
)
EXCLUDE_OPTION = Option(
    ("--exclude",),
    "exclude",
    "Leave out what fits this line of a .gitignore file; may be given more than once.",
    metavar="PATTERN",
    repeated=True,
)
OPTIONS = (
    *(Option((f"--{role}",), f"role_{role}", text) for role, text in ROLES.items()),
    Option(("--return",), "returns", "What the functions of this name return and yield."),
    Option(("--scope",), "scope", "Only in this class or function, such as Shop or Shop.add.", metavar="SCOPE"),
    Option(("--match",), "match", "How NAME is meant; without it by its form.", choices=("exact", "suffix", "glob")),
    Option(("--any",), "any_receiver", "NAME and everything that ends in .NAME; the same as --match suffix."),
    Option(("--path",), "path", "Only in files whose path, or the end of it, is like this.", metavar="GLOB"),
    EXCLUDE_OPTION,
    Option(("--json",), "as_json", "A JSON object an answer."),
    Option(("--long",), "long", "Below each place what is said of the name there."),
    Option(("-c", "--count"), "count", "Only the number of places."),
    Option(("-l", "--files"), "files", "Only the names of the files."),
    Option(
        ("--resolve",),
        "resolve",
        "NAME is what the program defines by it, such as Shop.total: who means that very thing, without an index;"
        " --root is a folder of the program.",
    ),
    INDEX_OPTION,
    ROOT_OPTION,
)
_BY_FLAG = {flag: option for option in OPTIONS for flag in option.flags}


def plain_parameters(arguments: Sequence[str]) -> dict[str, Any] | None:
    """The parameters that click would find, or None where it has to look for itself."""
    parameters: dict[str, Any] = {option.parameter: option.missing for option in OPTIONS}
    rest = iter(arguments)
    for argument in rest:
        option = _BY_FLAG.get(argument)
        if option is None:
            if argument.startswith("-") or "name" in parameters:
                return None
            parameters["name"] = argument
        elif option.takes_value:
            value = next(rest, "-")
            if (
                value.startswith("-")
                or (not value and option.is_path)
                or (option.choices and value not in option.choices)
            ):
                return None
            parameters[option.parameter] = (*parameters[option.parameter], value) if option.repeated else value
        else:
            parameters[option.parameter] = True
    return parameters if "name" in parameters else None
