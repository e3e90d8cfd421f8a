"""A static site of Python files: pages whose names lead to where they are defined and used.

The site needs no server and loads nothing from elsewhere. Pages are numbered, so that no file's name
becomes a path, and every text goes through `html.escape` or JSON on its way out.
"""
