"""The table generator and the parser engine: grammar files in pgen notation, parses token by token.

`ParserGenerator(filename).make_grammar()` gives the tables, `CreateParser(grammar, converter)` a parser that
is set up, fed and finished once an input. A token out of place is a `ParseError` with the context it was fed
with.
"""

from quillet.tarvex import _siblings

globals().update({name: value for name, value in vars(_siblings.optpgen).items() if not name.startswith("__")})
