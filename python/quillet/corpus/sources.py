"""What a corpus is made of: Parquet data sets, folders, tar and zip archives, wheels and sdists.

`units_of` lists them as units, each of which one worker reads from its beginning to its end, and `read` gives the
sources of one. A unit that cannot be read to its end gives a row that says why; so does a source that is too large.
"""

from __future__ import annotations

import os
import re
import zipfile
import zlib
from collections.abc import Iterable, Iterator, Sequence
from typing import Any, NamedTuple

from quillet.corpus.tar import TarError, regular_files

# What one row is: package, where it comes from, its path there, its bytes, and why there are none.
Row = tuple[str, str, str, "bytes | str | None", "str | None"]

_PYTHON = (".py", ".pyi", ".pyw")
_TAR = (".tar", ".tar.gz", ".tgz", ".tar.bz2", ".tbz2", ".tar.xz", ".txz")
_ZIP = (".zip", ".whl", ".egg")
_PARQUET = (".parquet", ".pq")
# What is larger is not analysed; a source takes some 20 to 60 times its size while it is.
MOST_BYTES = 64 << 20
# Bytes of source that a unit of files or row groups holds, nearly; and how much larger than an archive its content is.
_UNIT_BYTES = 8 << 20
_EXPANSION = 5
_SDIST = re.compile(r"(.+?)-v?\d[^/]*$")
_UNREADABLE = (OSError, EOFError, ValueError, RuntimeError, NotImplementedError, TarError, zipfile.BadZipFile)


class Unit(NamedTuple):
    """Something that one worker reads. `kind` is "files", "tar", "zip" or "parquet", `size` and `time` those of the
    file on disk, `weight` the bytes of source in it, nearly; `parts` are the files below a folder, with their stamps,
    or the first row group and the one behind the last.
    """

    kind: str
    path: str
    size: int
    time: int
    weight: int
    parts: list[Any]


class Columns(NamedTuple):
    """The names of columns in Parquet data sets."""

    path: str = "path"
    content: str = "content"
    package: str = "package"


def units_of(sources: Sequence[str]) -> Iterator[Unit]:
    """The units of files and folders, in the order of their names. Raises `OSError` for what does not exist."""
    for source in sources:
        full = os.path.abspath(source)
        if os.path.isdir(full):
            yield from _units_of_folder(full)
        else:
            yield from _units_of_file(full, os.stat(full))


def read(unit: Unit, columns: Columns) -> Iterator[Row]:
    """The sources of a unit, one after the other."""
    name = os.path.basename(unit.path)
    reader = {"files": _read_files, "tar": _read_tar, "zip": _read_zip, "parquet": _read_parquet}[unit.kind]
    try:
        yield from reader(unit, columns)
    except (*_UNREADABLE, zlib.error) as error:
        yield package_of(name), name, "", None, f"cannot be read to its end: {_reason(error)}"


def package_of(archive: str) -> str:
    """The project that the file of a wheel or an sdist is of: "flask" of "flask-3.0.tar.gz"."""
    stem = next((archive[: -len(end)] for end in (*_TAR, *_ZIP) if archive.lower().endswith(end)), archive)
    if archive.endswith(".whl"):
        return stem.partition("-")[0]
    match = _SDIST.match(stem)
    return match[1] if match else stem


# ---- units ----


def _units_of_folder(root: str) -> Iterator[Unit]:
    parts: list[tuple[str, int, int]] = []
    weight = 0
    for folder, folders, names in os.walk(root):
        folders.sort()
        for name in sorted(names):
            path = os.path.join(folder, name)
            lower = name.lower()
            try:
                status = os.stat(path)
            except OSError:
                continue
            if lower.endswith(_PYTHON):
                parts.append((os.path.relpath(path, root), status.st_size, status.st_mtime_ns))
                weight += status.st_size
                if weight >= _UNIT_BYTES:
                    yield Unit("files", root, 0, 0, weight, parts)
                    parts, weight = [], 0
            elif lower.endswith((*_TAR, *_ZIP, *_PARQUET)):
                yield from _units_of_file(path, status)
    if parts:
        yield Unit("files", root, 0, 0, weight, parts)


def _units_of_file(path: str, status: os.stat_result) -> Iterator[Unit]:
    lower = path.lower()
    size, time = status.st_size, status.st_mtime_ns
    if lower.endswith(_PARQUET):
        yield from _units_of_parquet(path, size, time)
    elif lower.endswith(_TAR):
        yield Unit("tar", path, size, time, size if lower.endswith(".tar") else size * _EXPANSION, [])
    elif lower.endswith(_ZIP):
        yield Unit("zip", path, size, time, size * _EXPANSION, [])
    else:
        folder, name = os.path.split(path)
        yield Unit("files", folder, 0, 0, size, [(name, size, time)])


def _units_of_parquet(path: str, size: int, time: int) -> Iterator[Unit]:
    from pyarrow import parquet

    try:
        metadata = parquet.read_metadata(path)
    except _UNREADABLE:  # told when it is read
        yield Unit("parquet", path, size, time, size, [0, 0])
        return
    first = weight = 0
    for group in range(metadata.num_row_groups):
        weight += metadata.row_group(group).total_byte_size
        if weight >= _UNIT_BYTES or group + 1 == metadata.num_row_groups:
            yield Unit("parquet", path, size, time, weight, [first, group + 1])
            first, weight = group + 1, 0


# ---- rows ----


def _read_files(unit: Unit, _columns: Columns) -> Iterator[Row]:
    source = os.path.basename(unit.path)
    for path, size, _ in unit.parts:
        package = path.partition(os.sep)[0] if os.sep in path else source
        name = os.fsencode(path).decode("utf-8", "backslashreplace")
        if size > MOST_BYTES:
            yield package, source, name, None, _too_large(size)
            continue
        try:
            with open(os.path.join(unit.path, path), "rb") as file:
                content = file.read()
        except OSError as error:
            yield package, source, name, None, _reason(error)
        else:
            yield package, source, name, content, None


def _read_tar(unit: Unit, _columns: Columns) -> Iterator[Row]:
    source = os.path.basename(unit.path)
    package = package_of(source)
    for name, size, content in regular_files(unit.path, _is_python, MOST_BYTES):
        problem = None
        if content is None:
            problem = _too_large(size) if size > MOST_BYTES else "the source is stored with holes"
        yield package, source, name, content, problem


def _is_python(name: str) -> bool:
    return name.lower().endswith(_PYTHON)


def _read_zip(unit: Unit, _columns: Columns) -> Iterator[Row]:
    source = os.path.basename(unit.path)
    package = package_of(source)
    with zipfile.ZipFile(unit.path) as archive:
        for member in archive.infolist():
            if member.is_dir() or not member.filename.lower().endswith(_PYTHON):
                continue
            name = member.filename.encode("utf-8", "backslashreplace").decode()
            if member.file_size > MOST_BYTES:
                yield package, source, name, None, _too_large(member.file_size)
                continue
            try:
                content = archive.read(member)
            except (*_UNREADABLE, zlib.error) as error:
                yield package, source, name, None, _reason(error)
            else:
                yield package, source, name, content, None


def _read_parquet(unit: Unit, columns: Columns) -> Iterator[Row]:
    from pyarrow import parquet

    source = os.path.basename(unit.path)
    with parquet.ParquetFile(unit.path) as file:
        known = file.schema_arrow.names
        missing = [name for name in (columns.path, columns.content) if name not in known]
        if missing:
            raise ValueError(f"there is no column {missing[0]!r}; there are: {', '.join(known)}")
        wanted = [name for name in columns if name in known]
        for batch in file.iter_batches(256, row_groups=list(range(*unit.parts)), columns=wanted, use_threads=False):
            for row in batch.to_pylist():
                content = row[columns.content]
                if content is not None and not isinstance(content, (bytes, str)):
                    raise ValueError(f"column {columns.content!r} must hold strings or bytes")
                problem = None if content is not None else "there is no source"
                yield str(row.get(columns.package) or ""), source, str(row[columns.path]), content, problem


def _too_large(size: int) -> str:
    return f"the source is too large: {size >> 20} MiB of at most {MOST_BYTES >> 20}"


def _reason(error: BaseException) -> str:
    text = getattr(error, "strerror", None) or str(error)
    return str(text).splitlines()[0] if text else type(error).__name__


def weight_of(units: Iterable[Unit]) -> int:
    """The bytes of source in some units, nearly."""
    return sum(unit.weight for unit in units)
