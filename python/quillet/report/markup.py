"""What the pages of the site share: their frame, and text that is shown and never markup."""

from __future__ import annotations

from html import escape

_CONTROL = {code: chr(0x2400 + code) for code in range(32) if code != 9} | {127: "␡"}
_HIDDEN = (*range(0x80, 0xA0), 0x61C, 0x200E, 0x200F, *range(0x2028, 0x202F), *range(0x2066, 0x206A))
_CONTROL |= {code: f"\\u{code:04x}" for code in _HIDDEN}
_POLICY = "default-src 'none'; style-src 'self' file:; script-src 'self' file:"


def shown(text: str) -> str:
    """Text for a page: escaped, with pictures of control characters in their place."""
    return escape(text.translate(_CONTROL))


def page_head(title: str, *, up: str, crumb: str, data: dict[str, int]) -> str:
    """A page up to its body. `up` leads to the folder of the site; `data` is what its script asks for."""
    attributes = "".join(f' data-{key}="{value}"' for key, value in data.items())
    folder, _, name = crumb.rpartition("/")
    path = f'<span class="path">{shown(folder + "/") if folder else ""}<b>{shown(name)}</b></span>' if crumb else ""
    return (
        '<!DOCTYPE html>\n<html lang="en"><head><meta charset="utf-8">\n'
        f'<meta http-equiv="Content-Security-Policy" content="{_POLICY}">\n'
        '<meta name="viewport" content="width=device-width, initial-scale=1">\n'
        '<meta name="color-scheme" content="light dark">\n'
        f'<title>{shown(title)}</title>\n<link rel="stylesheet" href="{up}style.css">\n'
        f'<script src="{up}script.js" data-up="{up}"{attributes} defer></script></head>\n'
        f'<body><header><a class="home" href="{up}index.html">quillet</a>{path}'
        '<div class="search" hidden><input id="search" type="search" placeholder="Find a definition or a file" '
        'aria-label="Find a definition or a file" autocomplete="off" spellcheck="false"><kbd>/</kbd></div></header>\n'
    )


PAGE_END = "</body></html>\n"
