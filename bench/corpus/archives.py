"""Source archives to measure with: those of named packages by pip, and those of what is installed, packed again.

pip is asked for each name once, with the index that it is configured for; names.txt has some to begin with. Archives
that are made are those of installed distributions, as sdists are: name-version.tar.gz with one folder inside. Where
there are too few, they are written again under other names, which is said.
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
from tempfile import TemporaryDirectory

# What is larger says more of one package than of a corpus.
_MOST_ARCHIVE_BYTES = 8 << 20


def fetch(wanted: Iterable[str], folder: Path, most_bytes: int = 2 << 30) -> int:
    """Fetches the source archives of some packages ("name" or "name==version"); gives how many there are.

    What is there, or was found not to be had, is not asked for again, so that a run which was ended goes on.
    """
    folder.mkdir(parents=True, exist_ok=True)
    missing = folder / "missing.txt"
    passed_over = set(missing.read_text().split()) if missing.exists() else set()
    for each in wanted:
        name = each.partition("=")[0]
        if each in passed_over or list(folder.glob(f"{_any_spelling(name)}-[0-9]*")):
            continue
        with TemporaryDirectory(dir=folder) as beside:
            command = [sys.executable, "-m", "pip", "download", "-q", "--no-deps", "--no-binary", ":all:"]
            failed = subprocess.run([*command, "-d", beside, each], capture_output=True).returncode != 0
            archives = [path for path in Path(beside).iterdir() if path.stat().st_size <= _MOST_ARCHIVE_BYTES]
            if failed or not archives:
                print(f"{each}: {'cannot be had' if failed else 'is too large'}", file=sys.stderr)
                with missing.open("a") as file:
                    file.write(f"{each}\n")
                continue
            if sum(path.stat().st_size for path in (*_archives_in(folder), *archives)) > most_bytes:
                break
            for path in archives:
                path.rename(folder / path.name)
    return len(_archives_in(folder))


def _any_spelling(name: str) -> str:
    """What the file of a package may be called, for glob: upper and lower case, and one sign between words."""
    return "".join(f"[{c.lower()}{c.upper()}]" if c.isalpha() else "[-_.]" if c in "-_." else c for c in name)


def _archives_in(folder: Path) -> list[Path]:
    return [path for path in folder.iterdir() if path.name.endswith((".tar.gz", ".zip", ".tar.bz2"))]


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
