"""Tuples whose places have names, declared as those of `typing.NamedTuple` are.

Loading typing and making a dozen of its classes takes longer than a first question about a program takes to answer.
To whoever checks types these are those of typing.
"""

from __future__ import annotations

from operator import itemgetter

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterable
    from typing import Any


class _Declared(type):
    """Makes a class of the annotations in its body, where fields may have defaults."""

    _fields: tuple[str, ...]
    _field_defaults: dict[str, Any]

    def __new__(cls, name: str, bases: tuple[type, ...], body: dict[str, Any]) -> _Declared:
        fields = tuple(body.get("__annotations__", ()))
        body["_field_defaults"] = {field: body[field] for field in fields if field in body}
        body["_fields"] = body["__match_args__"] = fields
        body["__slots__"] = ()
        for place, field in enumerate(fields):
            body[field] = property(itemgetter(place))
        return super().__new__(cls, name, bases, body)


class NamedTuple(tuple, metaclass=_Declared):  # type: ignore[type-arg]
    """What `typing.NamedTuple` makes, but for the signature."""

    def __new__(cls, *values: object, **named: object) -> NamedTuple:
        if named or len(values) != len(cls._fields):
            given = {**dict(zip(cls._fields, values, strict=False)), **named}
            whole = {**cls._field_defaults, **given}
            if len(given) != len(values) + len(named) or whole.keys() != set(cls._fields):
                raise TypeError(f"{cls.__name__} takes {', '.join(cls._fields)}, each once")
            values = tuple(whole[field] for field in cls._fields)
        return tuple.__new__(cls, values)

    @classmethod
    def _make(cls, values: Iterable[object]) -> NamedTuple:
        """One of the values of all fields."""
        made = tuple.__new__(cls, values)
        if len(made) != len(cls._fields):
            raise TypeError(f"{cls.__name__} takes {len(cls._fields)} values, not {len(made)}")
        return made

    def _replace(self, **changes: object) -> NamedTuple:
        """The same with other values of some fields."""
        made = self._make(changes.pop(field, value) for field, value in self._asdict().items())
        if changes:
            raise ValueError(f"{type(self).__name__} has no {', '.join(changes)}")
        return made

    def _asdict(self) -> dict[str, Any]:
        """The values by the names of their fields."""
        return dict(zip(type(self)._fields, self, strict=True))

    def __getnewargs__(self) -> tuple[object, ...]:
        return tuple(self)

    def __repr__(self) -> str:
        return f"{type(self).__name__}({', '.join(f'{field}={value!r}' for field, value in self._asdict().items())})"
