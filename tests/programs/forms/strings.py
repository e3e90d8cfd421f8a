"""Strings and what stands in them."""
name, width, values = "n", 3, {"a": 1}
plain = 'single' "double" '''long
lines''' """and "more" of them""" r'\raw' b'bytes' rb"\x00" u'text' Rb'x' BR'' F'' fR"\{name}"
escapes = "\n\x41\u00e9\U0001F600\N{BULLET}\101\
continued" '\'' "\"" '\\' "\q"
fields = f"{name}" f'{name!r}{name!s:>{width}}{width:0{width}.{width}f}' f"{{literal}}" f"{values['a']}{name=}{ name = !r:^10}"
nested = f"{f'{f"{name}"}'}" f"{'a' if name else "b"}" f"{(lambda x: x)(1)}" f"{[y for y in name]!a}" f"{name:{'>'}{width}}"
long_one = f"""
{name
   .upper()  # comment
} {
  width:
>10}
""" f'{name:%Y-%m-%d}' rf"\d{width}" fr'{name}\{width}'
templates = t"hello {name!r:>{width}}" t'{width}' rt"\{name}" tr'{name=}'
percent = "%s %(a)d %%" % (name,) + "%-5.2f%*d" % (1.0, 2, 3)
formatted = "{} {0.upper} {a[b]!r:>{w}}".format(name, a=1)
walrus = f"{(z := 1)}" f"{z:=5}" f"{name!r:}" f"{{}}" f"{ {1: 2}[1] }" f"{yield_}" f"{*values,}"
bad = f"{" f"}" f"{}" f"{name!x}" f"{name!}" f"{a b}" f"{name:{}" f"{!r}" f"{lambda x: 1}" f"{=}" f"{name#}"
bad_bytes = b"é" b"\xff" "\x4" "\u12" "\N{NOPE" "\UFFFFFFFF" b'a' 'b' t"x" "y" f'x' t'y' b'' f''
unclosed = 'abc
still = "abc\
def"
typed: "list['int']" = []
other: 'dict[str, "Missing"]' = {}
stars = "*" * 3, """doc""", '''x''' ''
very_long = "................................................................................................................................................................................................................................................................................................................"
