"""The index: what a repository's statements say of names, in one SQLite file that answers at once.

`update` brings an index up to date with the files on disk, `questions` asks it, `export_*` hand it on.
The tables are described in docs/index.md.
"""
