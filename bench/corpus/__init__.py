"""Measures a corpus: see __main__.py."""
