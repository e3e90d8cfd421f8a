"""Source archives to measure with: those of named packages by pip, and those of what is installed, packed again.

pip is asked for each name once, with the index that it is configured for. Archives that are made are those of
installed distributions, as sdists are: name-version.tar.gz with one folder inside. Where there are too few, they are
written again under other names, which is said.
"""

from __future__ import annotations

import importlib.metadata
import io
import os
import subprocess
import sys
import tarfile
from collections.abc import Iterable, Iterator
from pathlib import Path

# What is larger says more of one package than of a corpus.
_MOST_ARCHIVE_BYTES = 8 << 20


def fetch(names: Iterable[str], folder: Path, most_bytes: int = 2 << 30) -> int:
    """Fetches the source archives of some packages, unless they are there; gives how many there are."""
    folder.mkdir(parents=True, exist_ok=True)
    for name in names:
        if list(folder.glob(f"{name.replace('-', '[-_.]')}-[0-9]*")):
            continue
        if sum(path.stat().st_size for path in folder.iterdir()) > most_bytes:
            break
        command = [sys.executable, "-m", "pip", "download", "-q", "--no-deps", "--no-binary", ":all:"]
        if subprocess.run([*command, "-d", str(folder), name], capture_output=True).returncode != 0:
            print(f"{name}: cannot be had", file=sys.stderr)
        for path in folder.iterdir():
            if path.stat().st_size > _MOST_ARCHIVE_BYTES:
                path.write_bytes(b"")
    return sum(path.stat().st_size > 0 for path in folder.iterdir())


def pack(sites: Iterable[str], folder: Path, count: int) -> tuple[int, int]:
    """Packs what is installed, each distribution once, and again under other names up to `count` archives.

    Gives how many are different, and how many there are.
    """
    folder.mkdir(parents=True, exist_ok=True)
    known: dict[str, Path] = {}
    for distribution in importlib.metadata.distributions(path=list(sites)):
        stem = f"{distribution.metadata['Name'] or 'unknown'}-{distribution.version}"
        if stem in known or len(known) == count:
            continue
        files = list(_python_files(distribution))
        if files:
            known[stem] = folder / f"{stem}.tar.gz"
            _write(known[stem], stem, files)
    made = len(known)
    turn = 0
    while 0 < made < count:
        turn += 1
        for stem, path in list(known.items())[: count - made]:
            name, _, version = stem.rpartition("-")
            copy = folder / f"{name}.copy{turn}-{version}.tar.gz"
            if not copy.exists():
                os.link(path, copy)
            made += 1
    return len(known), made


def _python_files(distribution: importlib.metadata.Distribution) -> Iterator[tuple[str, bytes]]:
    for path in distribution.files or ():
        if path.suffix in (".py", ".pyi") and ".." not in path.parts:
            try:
                yield str(path), Path(str(path.locate())).read_bytes()
            except OSError:
                continue


def _write(path: Path, root: str, files: list[tuple[str, bytes]]) -> None:
    if path.exists():
        return
    beside = path.with_suffix(".part")
    with tarfile.open(beside, "w:gz", compresslevel=5) as archive:
        for name, content in files:
            info = tarfile.TarInfo(f"{root}/{name}")
            info.size = len(content)
            archive.addfile(info, io.BytesIO(content))
    beside.rename(path)
