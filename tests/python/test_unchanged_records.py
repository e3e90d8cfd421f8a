"""What statements of two whole libraries say by the grammars, byte for byte as when it was written down.

Hosts rely on these records: however they are come by, they stay. The libraries are those of two Pythons to the last
patch, told by a hash of their sources; where they are not on this machine, there is nothing to compare.

python tests/python/test_unchanged_records.py    what is to be written down
"""

from __future__ import annotations

import hashlib
from functools import cache

import pytest

from quillet import SourceEncodingError, analyze
from survey import Library, libraries

#: By version: its sources, and what was said of them.
EXPECTED: dict[tuple[int, int], tuple[str, str]] = {
    (2, 7): ("28208332cb1ded52b89cce5eeb283df4", "832b978094656a74226f4779b2982407"),
    (3, 11): ("a7e83b235fb6b5fa2562b11e9247097d", "3ee0e6b4a776bd90c91010d3824f509d"),
}


@cache
def found_libraries() -> dict[tuple[int, int], Library]:
    return libraries()


def sources_of(library: Library) -> dict[str, bytes]:
    return {path.relative_to(library.root).as_posix(): path.read_bytes() for path in library.files()}


def hash_of_sources(sources: dict[str, bytes]) -> str:
    digest = hashlib.sha256()
    for path, data in sources.items():
        digest.update(f"{path} {len(data)}\n".encode() + data)
    return digest.hexdigest()[:32]


def hash_of_records(sources: dict[str, bytes], version: tuple[int, int]) -> str:
    """Of all lines of all files: the raw pairs, the errors, and where the lines stand."""
    digest = hashlib.sha256()
    for data in sources.values():
        try:
            lines = analyze(data, version=version, exact=True).lines
        except SourceEncodingError:
            continue
        for line in lines:
            error = line.error and (line.error.msg, line.error_position)
            place = (line.first_line, line.last_line, line.indent, line.in_async_def, line.first_in_def)
            said = (place, error, line.logical.fTypeEquivs, line.logical.fArgTypeEquivs)
            digest.update(repr(said).encode())
    return digest.hexdigest()[:32]


@pytest.mark.parametrize("version", EXPECTED, ids=lambda version: f"{version[0]}.{version[1]}")
def test_records_are_what_they_were(version: tuple[int, int]) -> None:
    expected_sources, expected_records = EXPECTED[version]
    library = found_libraries().get(version)
    if library is None:
        pytest.skip(f"no Python {version[0]}.{version[1]} on this machine")
    sources = sources_of(library)
    if hash_of_sources(sources) != expected_sources:
        pytest.skip(f"the library of {library.name} is another one than what was written down is of")
    assert hash_of_records(sources, version) == expected_records


if __name__ == "__main__":
    for known in EXPECTED:
        files = sources_of(found_libraries()[known])
        print(f'{known}: ("{hash_of_sources(files)}", "{hash_of_records(files, known)}"),')
