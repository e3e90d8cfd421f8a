"""The archives of sources that the corpus reads by itself, held against `tarfile`, which writes them here."""

from __future__ import annotations

import gzip
import io
import random
import tarfile
from pathlib import Path

import pytest
from hypothesis import HealthCheck, given, settings
from hypothesis import strategies as st

from quillet.corpus.tar import TarError, regular_files

FORMATS = [tarfile.USTAR_FORMAT, tarfile.GNU_FORMAT, tarfile.PAX_FORMAT]


def written(members: list[tuple[str, bytes]], tar_format: int, mode: str = "w") -> bytes:
    buffer = io.BytesIO()
    with tarfile.open(fileobj=buffer, mode=mode, format=tar_format) as archive:
        for name, content in members:
            info = tarfile.TarInfo(name)
            info.size = len(content)
            archive.addfile(info, io.BytesIO(content))
    return buffer.getvalue()


def read(path: Path, most: int = 1 << 20) -> list[tuple[str, int, bytes | None]]:
    return list(regular_files(str(path), lambda name: name.endswith(".py"), most))


def expected(path: Path) -> list[tuple[str, bytes]]:
    with tarfile.open(path) as archive:
        files = [member for member in archive if member.isreg() and member.name.endswith(".py")]
        return [(member.name, archive.extractfile(member).read()) for member in files]


@pytest.mark.parametrize("tar_format", FORMATS)
@pytest.mark.parametrize("mode", ["w", "w:gz", "w:bz2", "w:xz"])
def test_all_formats(tmp_path: Path, tar_format: int, mode: str) -> None:
    chance = random.Random(1)
    members = [("a.py", b"x"), ("empty.py", b""), ("notes.txt", b"1" * 700), ("d/block.py", chance.randbytes(1024))]
    members += [("e" * 90 + "/" + "n" * 60 + ".py", b"long"), ("large.py", chance.randbytes(300_000))]
    if tar_format != tarfile.USTAR_FORMAT:
        members += [("p" * 300 + ".py", b"longer"), ("é.py", b"e"), ("after.py", b"y")]
    path = tmp_path / "a.tar"
    path.write_bytes(written(members, tar_format, mode))
    found = [(name, content) for name, _, content in read(path)]
    assert found == expected(path)
    assert [name for name, _ in found] == [name for name, _ in members if name.endswith(".py")]
    assert read(path, 100_000)[[name for name, _ in found].index("large.py")] == ("large.py", 300_000, None)


@pytest.mark.parametrize("tar_format", FORMATS)
def test_what_is_no_file_has_no_content(tmp_path: Path, tar_format: int) -> None:
    buffer = io.BytesIO()
    with tarfile.open(fileobj=buffer, mode="w", format=tar_format) as archive:
        for kind in (tarfile.DIRTYPE, tarfile.SYMTYPE, tarfile.LNKTYPE, tarfile.FIFOTYPE, tarfile.CHRTYPE):
            info = tarfile.TarInfo("odd.py")
            info.type, info.linkname = kind, "l" * (200 if tar_format != tarfile.USTAR_FORMAT else 20)
            archive.addfile(info)
        info = tarfile.TarInfo("a.py")
        info.size = 3
        archive.addfile(info, io.BytesIO(b"abc"))
    path = tmp_path / "a.tar"
    path.write_bytes(buffer.getvalue())
    assert read(path) == [("a.py", 3, b"abc")]


def test_attributes_for_all_files_and_for_one(tmp_path: Path) -> None:
    buffer = io.BytesIO()
    options = {"format": tarfile.PAX_FORMAT, "pax_headers": {"comment": "0123456789abcdef"}}
    with tarfile.open(fileobj=buffer, mode="w", **options) as archive:
        for name in ("a.py", "b.py"):
            info = tarfile.TarInfo(name)
            info.size, info.mtime = 3, 0.5
            archive.addfile(info, io.BytesIO(b"abc"))
        sparse = tarfile.TarInfo("sparse.py")
        sparse.size, sparse.pax_headers = 5, {"GNU.sparse.major": "1"}
        archive.addfile(sparse, io.BytesIO(b"abcde"))
    path = tmp_path / "a.tar"
    path.write_bytes(buffer.getvalue())
    assert read(path) == [("a.py", 3, b"abc"), ("b.py", 3, b"abc"), ("sparse.py", 5, None)]


def test_streams_one_behind_the_other(tmp_path: Path) -> None:
    data = written([("a.py", b"1" * 5000), ("b.py", b"2" * 5000)], tarfile.USTAR_FORMAT)
    path = tmp_path / "a.tgz"
    path.write_bytes(gzip.compress(data[:3000]) + gzip.compress(data[3000:]) + bytes(1000))
    assert [(name, size) for name, size, _ in read(path)] == [("a.py", 5000), ("b.py", 5000)]


@pytest.mark.parametrize("mode", ["w", "w:gz", "w:bz2", "w:xz"])
def test_an_archive_that_breaks_off_says_so(tmp_path: Path, mode: str) -> None:
    chance = random.Random(2)
    members = [(f"{number}.py", chance.randbytes(900)) for number in range(4)]
    data = written(members, tarfile.GNU_FORMAT, mode)
    path = tmp_path / "a.tar"
    told = 0
    for size in range(1, len(data), 331):
        path.write_bytes(data[:size])
        found = []
        try:
            for each in regular_files(str(path), lambda name: True, 1 << 20):
                found.append(each)
        except TarError:
            told += 1
        else:
            assert len(found) == 4 or size % 512 == 0
        assert [(name, content) for name, _, content in found] == members[: len(found)]
    assert told > 5


@settings(max_examples=100, deadline=None, suppress_health_check=[HealthCheck.function_scoped_fixture])
@given(st.data())
def test_damaged_archives_end_in_an_error_at_worst(tmp_path: Path, data: st.DataObject) -> None:
    mode = data.draw(st.sampled_from(["w", "w:gz", "w:bz2", "w:xz"]))
    members = [("a" * 120 + ".py", b"x" * 600), ("b.py", b"y" * 10), ("é.py", b"z")]
    archive = bytearray(written(members, data.draw(st.sampled_from(FORMATS[1:])), mode))
    for _ in range(data.draw(st.integers(1, 4))):
        archive[data.draw(st.integers(0, len(archive) - 1))] = data.draw(st.integers(0, 255))
    path = tmp_path / "a.tar"
    path.write_bytes(archive)
    try:
        for _, size, content in read(path):
            assert content is None or len(content) == size
    except TarError:
        pass


def test_what_is_no_archive(tmp_path: Path) -> None:
    path = tmp_path / "a.tar"
    for data in (b"\x1f\x8b", b"BZh9", b"\xfd7zXZ\x00", b"x", b"x" * 512, b"x" * 5000):
        path.write_bytes(data)
        with pytest.raises(TarError):
            read(path)
    path.write_bytes(b"")
    assert read(path) == []
