"""Measurements of the language server; see __main__.py."""
