"""Ignore rules against git's own answers, over random rules and trees; skips where git is missing.

Run at length with: python tests/python/test_gitignore_agreement.py [ROUNDS]
"""

from __future__ import annotations

import os
import random
import shutil
import subprocess
import sys
from pathlib import Path

import pytest

from quillet.cli.files import find_files

needs_git = pytest.mark.skipif(shutil.which("git") is None, reason="git is not installed")

NAMES = [b"a", b"b", b"ab", b"a.py", b"b.py", b"ab.py", b"a b", b"a ", b"[a]", b"a*", b"\\a", b"!a", b"#a", b"x-y"]
NAMES += [b"a\x0bb", b"a\xc2\x85b", b"a\xe2\x80\xa8b", b"\xff", b"B", b"1", b"a\x0c", b"\xc3\xa4", b"a]", b"-", b"a\r"]
PIECES = [
    b"a",
    b"b",
    b"*",
    b"**",
    b"?",
    b"/",
    b"/",
    b"**/",
    b"/**",
    b".py",
    b"\\",
    b"[a-b]",
    b"[!a]",
    b"[^b-z]",
    b"[z-a]",
]
PIECES += [
    b"[[:alpha:]]",
    b"[[:digit:]a]",
    b"[[:none:]]",
    b"[[:a]",
    b"[]a]",
    b"[a",
    b"]",
    b"-",
    b"!",
    b"#",
    b" ",
    b"\\ ",
]
PIECES += [
    b"\x0b",
    b"\x0c",
    b"\xc2\x85",
    b"\xe2\x80\xa8",
    b"\xff",
    b"\t",
    b"\r",
    b"*a*",
    b"[\\]]",
    b"[a-\\c]",
    b"[[:space:]]",
]
PIECES += [
    b"[[:punct:]]",
    b"[[:cntrl:]]",
    b"[[:graph:]!]",
    b"[[:print:]]",
    b"[[:upper:][:xdigit:]]",
    b"\\/",
    b"\\*",
    b"[/]",
]


def random_rules(random_: random.Random) -> bytes:
    lines = []
    for _ in range(random_.randrange(1, 7)):
        line = b"".join(random_.choices(PIECES, k=random_.randrange(1, 6)))
        if random_.random() < 0.2:
            line = b"/".join(random_.choices([b"a", b"b", b"*", b"**", b"a*", b"*b", b"?", b"**a"], k=3))
        if random_.random() < 0.25:
            line = b"!" + line
        lines.append(line + random_.choice([b"", b"", b"", b"/", b" ", b"  ", b"\\ "]))
    text = random_.choice([b"\n", b"\n", b"\r\n"]).join(lines)
    return random_.choice([b"", b"", b"", b"\xef\xbb\xbf"]) + text + random_.choice([b"", b"\n", b"\r"])


def make_tree(random_: random.Random, folder: bytes, depth: int) -> None:
    os.makedirs(folder, exist_ok=True)
    if random_.random() < (1.0 if depth == 3 else 0.3):
        with open(folder + b"/.gitignore", "wb") as file:
            file.write(random_rules(random_))
    for name in random_.sample(NAMES, 6):
        path = folder + b"/" + name
        if depth and random_.random() < 0.5:
            make_tree(random_, path, depth - 1)
        else:
            with open(path, "wb") as file:
                file.write(b"#!/usr/bin/env python3\n")


def files_below(folder: bytes) -> list[bytes]:
    return [
        os.path.relpath(os.path.join(at, name), folder)
        for at, folders, names in os.walk(folder)
        if folders.sort() is None and b"/.git" not in at
        for name in names
        if name != b".gitignore"
    ]


def ignored_by_git(folder: bytes, paths: list[bytes]) -> set[bytes]:
    result = subprocess.run(
        [
            "git",
            "-c",
            "core.excludesFile=",
            "-c",
            "core.ignoreCase=false",
            "check-ignore",
            "--no-index",
            "-z",
            "--stdin",
        ],
        input=b"\0".join(paths),
        cwd=folder,
        capture_output=True,
        check=False,
    )
    assert result.returncode in (0, 1), result.stderr
    return set(filter(None, result.stdout.split(b"\0")))


def differences(seed: int, folder: Path) -> tuple[list[str], int, int]:
    """What git and the walk say differently of a random tree, and how many paths git ignores and keeps."""
    random_ = random.Random(seed)
    top = os.fsencode(folder)
    subprocess.run(["git", "init", "-q", folder], check=True)
    make_tree(random_, top, 3)
    if random_.random() < 0.5:
        os.makedirs(top + b"/.git/info", exist_ok=True)
        with open(top + b"/.git/info/exclude", "wb") as file:
            file.write(random_rules(random_))
    # A file with another suffix than Python's is none of the walk's.
    paths = [path for path in files_below(top) if b"." not in os.path.basename(path) or path.endswith(b".py")]
    ignored = ignored_by_git(top, paths)
    found = {os.path.relpath(os.fsencode(item.path), top) for item in find_files((str(folder),), gitignore=True)}
    wrong = [
        f"{seed}: {path!r} is {'ignored' if path in ignored else 'kept'} by git"
        for path in paths
        if (path in found) == (path in ignored)
    ]
    return wrong, len(ignored), len(paths) - len(ignored)


@needs_git
@pytest.mark.parametrize("seed", range(25))
def test_the_walk_takes_what_git_does_not_ignore(seed: int, tmp_path: Path) -> None:
    wrong, _, _ = differences(seed, tmp_path)
    assert wrong == []


def main(rounds: int) -> None:
    import tempfile

    wrong = ignored = kept = 0
    for seed in range(1000, 1000 + rounds):
        with tempfile.TemporaryDirectory() as folder:
            lines, ignored_here, kept_here = differences(seed, Path(folder))
        for line in lines:
            print(line)
        wrong, ignored, kept = wrong + len(lines), ignored + ignored_here, kept + kept_here
    print(f"{rounds} trees, {ignored} paths ignored and {kept} kept by git, {wrong} differences")


if __name__ == "__main__":
    main(int(sys.argv[1]) if len(sys.argv) > 1 else 1000)
