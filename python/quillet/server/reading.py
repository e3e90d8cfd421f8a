"""What a text says to its reader: hovers, signatures, colours, folds, selections and hints within the lines."""

from __future__ import annotations

from quillet.server.features import feature
from quillet.server.language_server import Server
from quillet.server.positions import place_of, range_of

TYPE_CHECKING = False
if TYPE_CHECKING:
    from typing import Any

    from lsprotocol import types

# As the protocol numbers kinds of hints.
_TYPE, _PARAMETER = 1, 2
# In the order of the numbers that workspaces give.
TOKEN_TYPES = [
    "namespace",
    "class",
    "enum",
    "typeParameter",
    "function",
    "method",
    "property",
    "variable",
    "parameter",
    "enumMember",
    "decorator",
]
TOKEN_MODIFIERS = ["declaration", "readonly", "static", "async", "modification", "documentation", "defaultLibrary"]


@feature("textDocument/hover", "hoverProvider")
def hover(ls: Server, params: types.HoverParams) -> Any:
    place = ls.place(params)
    found = place.workspace.hover(*place.at)
    if found is None or not place.settings.admits(found.certainty):
        return None
    parts = [f"```python\n{found.text}\n```" if ls.has_markdown else found.text] if found.text else []
    shown = [text for text in found.types if text not in found.text]
    if shown and not found.text.startswith(("def ", "class ", "async def ", "module ")):
        types_text = " | ".join(shown)
        parts.append(f"`{types_text}`" if ls.has_markdown else types_text)
    if found.documentation:
        parts.append(_documentation(ls, found.documentation))
    if found.certainty != "certain":
        parts.append(f"*{found.certainty}*" if ls.has_markdown else f"({found.certainty})")
    value = ("\n\n---\n\n" if ls.has_markdown else "\n\n").join(parts)
    return {
        "contents": ls.markup(value),
        "range": range_of(found.line, found.column, found.line, found.end_column),
    }


def _documentation(ls: Server, text: str) -> str:
    """A docstring, which is plain text, so that Markdown shows it as it is written."""
    if not ls.has_markdown:
        return text
    lines = []
    is_code = False
    for line in text.splitlines():
        stripped = line.strip()
        if stripped.startswith("```"):
            is_code = not is_code
        elif not is_code and stripped and not line.startswith("    "):
            for mark in ("\\", "*", "_", "<", "#"):
                line = line.replace(mark, "\\" + mark)
            line += "  "
        lines.append(line)
    return "\n".join(lines)


def documentation(ls: Server, text: str) -> Any:
    """A docstring for the client."""
    return ls.markup(_documentation(ls, text))


@feature(
    "textDocument/signatureHelp",
    "signatureHelpProvider",
    {"triggerCharacters": ["(", ","], "retriggerCharacters": [")"]},
)
def signature_help(ls: Server, params: types.SignatureHelpParams) -> Any:
    place = ls.place(params)
    found = [each for each in place.workspace.signatures(*place.at) if place.settings.admits(each.certainty)]
    if not found:
        return None
    signatures = []
    for each in found:
        signature: dict[str, Any] = {
            "label": each.label,
            "parameters": [{"label": parameter.label} for parameter in each.parameters],
        }
        if each.documentation:
            signature["documentation"] = documentation(ls, each.documentation)
        if each.active is not None:
            signature["activeParameter"] = each.active
        signatures.append(signature)
    first = next((index for index, each in enumerate(found) if each.active is not None), 0)
    answer: dict[str, Any] = {"signatures": signatures, "activeSignature": first}
    if found[first].active is not None:
        answer["activeParameter"] = found[first].active
    return answer


# ---- the shape of a text ----


@feature("textDocument/foldingRange", "foldingRangeProvider")
def folding_range(ls: Server, params: types.FoldingRangeParams) -> Any:
    workspace, _, path = ls.file(params.text_document.uri)
    return [
        {"startLine": first - 1, "endLine": last - 1, **({"kind": kind} if kind else {})}
        for first, last, kind in workspace.folds(path)
    ]


@feature("textDocument/selectionRange", "selectionRangeProvider")
def selection_range(ls: Server, params: types.SelectionRangeParams) -> Any:
    workspace, _, path = ls.file(params.text_document.uri)
    answer = []
    for position in params.positions:
        selection: dict[str, Any] | None = None
        for span in reversed(workspace.selections(path, *place_of(position))):
            selection = {"range": range_of(*span), **({"parent": selection} if selection else {})}
        line, column = place_of(position)
        answer.append(selection or {"range": range_of(line, column, line, column)})
    return answer


@feature(
    "textDocument/semanticTokens/full",
    "semanticTokensProvider",
    {"legend": {"tokenTypes": TOKEN_TYPES, "tokenModifiers": TOKEN_MODIFIERS}, "range": True, "full": True},
)
def semantic_tokens(ls: Server, params: types.SemanticTokensParams) -> Any:
    workspace, _, path = ls.file(params.text_document.uri)
    return {"data": workspace.tokens(path)}


@feature("textDocument/semanticTokens/range")
def semantic_tokens_range(ls: Server, params: types.SemanticTokensRangeParams) -> Any:
    workspace, _, path = ls.file(params.text_document.uri)
    first, last = place_of(params.range.start)[0], place_of(params.range.end)[0]
    return {"data": workspace.tokens(path, first, last)}


@feature("textDocument/inlayHint", "inlayHintProvider", {"resolveProvider": False})
def inlay_hint(ls: Server, params: types.InlayHintParams) -> Any:
    workspace, settings, path = ls.file(params.text_document.uri)
    first, last = place_of(params.range.start)[0], place_of(params.range.end)[0]
    answer = []
    for hint in workspace.hints(path, first, last):
        if not settings.admits(hint.certainty):
            continue
        is_type = hint.kind == "type"
        answer.append(
            {
                "position": {"line": hint.line - 1, "character": hint.column - 1},
                "label": hint.text,
                "kind": _TYPE if is_type else _PARAMETER,
                "paddingRight": not is_type,
            }
        )
    return answer
