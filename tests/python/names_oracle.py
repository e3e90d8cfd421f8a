# -*- coding: utf-8 -*-
"""What the interpreter that runs this says of the names of its own sources: for Python 2.7 and 3.8 to 3.13.

Reads paths from the standard input, one a line, and writes a line of JSON for each file:

    {"refused": why}                 the interpreter does not compile it
    {"failed": why}                  this program does not understand it
    {"table": ..., "scopes": ..., "names": ..., "strings": ..., "spread": ..., "unwritten": ...}

`table` is what `symtable` says, [type, name, line, {symbol: answers}, [children]], the answers as a number with a
bit for each of QUESTIONS. `names` are all the names that `ast` shows, in the order of the source, as
[line, column, end column, what, marks, receiver, scope]. `what` is the class of the node; `marks` are letters, see
MARKS; `receiver` is the index of the name that an attribute is taken from, or -1; `scope` is an index in `scopes`,
[kind, name, parent, first line, last line, column], which follow from the rules of the language and not from
`symtable`. `strings` are the names in the strings of annotations. `spread` are the first and last lines of f-strings on
several lines, `unwritten` the scopes with a slice of 2.7 whose step nobody wrote.

`ast` gives the places of many names approximately or not at all. So a place is that of the token: the names of the
tree, in the order of the source, are the tokens of the source that are names and no keywords, one for one, and a
file where they are not is an error. Tokens of f-strings before 3.12 are those of their fields.
"""

from __future__ import print_function

import ast
import io
import json
import keyword
import symtable
import sys
import threading
import tokenize
import unicodedata
import warnings

OLD = sys.version_info[0] == 2
QUESTIONS = (
    "is_parameter", "is_global", "is_declared_global", "is_nonlocal", "is_local", "is_free", "is_imported",
    "is_assigned", "is_referenced", "is_annotated", "is_namespace",
)  # fmt: skip

# Of `marks`: how a name is used, and where.
MARKS = {
    "r": "read", "w": "written", "x": "deleted", "c": "called", "d": "decorator", "b": "base", "a": "annotation",
    "u": "augmented", "s": "star import of a module", "*": "for", "f": "in a field of an f-string",
}  # fmt: skip

KEYWORDS = set(keyword.kwlist)


class Unlike(Exception):
    """The names of the tree are not the tokens of the source."""


# ---- symtable ----


def table_of(table):
    """A scope as `symtable` has it, and what is nested in it."""
    symbols = {}
    for symbol in table.get_symbols():
        answers = 0
        for bit, question in enumerate(QUESTIONS):
            if getattr(symbol, question, bool)():
                answers |= 1 << bit
        symbols[symbol.get_name()] = answers
    kind = str(getattr(table.get_type(), "value", table.get_type()))
    children = [table_of(child) for child in table.get_children()]
    return [kind, table.get_name(), table.get_lineno(), symbols, children]


# ---- tokens ----


class Token(object):
    __slots__ = ("text", "line", "column", "end")

    def __init__(self, text, line, column):
        self.text = text
        self.line = line  # from 1
        self.column = column  # in characters, from 0


def tokens_of(text, at_line=1, at_column=0):
    """The tokens of a text, (kind, text, line, column), where its first character stands in the given place."""
    lines = io.StringIO(text)
    for kind, string, (line, column) in whole_names(tokenize.generate_tokens(lines.readline)):
        yield kind, string, line + at_line - 1, column + (at_column if line == 1 else 0)


def whole_names(tokens):
    """The tokens, with names in one piece: before 3.12 `tokenize` knows fewer characters than the language."""
    held = None
    for token in tokens:
        kind, string, begin, end = token[:4]
        if held is not None:
            if held[3] == begin and kind in (tokenize.NAME, tokenize.ERRORTOKEN) and is_name(held[1] + string):
                held = (tokenize.NAME, held[1] + string, held[2], end)
                continue
            yield held[:3]
            held = None
        if not OLD and (kind == tokenize.NAME or (kind == tokenize.ERRORTOKEN and is_name(string))):
            held = (tokenize.NAME, string, begin, end)
        else:
            yield kind, string, begin
    if held is not None:
        yield held[:3]


def is_name(text):
    return text.isidentifier()


def names_in(text, at_line=1, at_column=0):
    """The tokens of a text that may be names, also those of f-strings' fields."""
    behind_bang = False
    for kind, string, line, column in tokens_of(text, at_line, at_column):
        if kind == tokenize.NAME and not behind_bang:
            yield Token(string, line, column)
        elif kind == tokenize.STRING and not OLD and "f" in string[: string.index(string[-1])].lower():
            for token in names_in_fields(string, line, column):
                yield token
        behind_bang = string == "!" and kind == tokenize.OP


def names_in_fields(literal, line, column):
    """The names in the fields of an f-string that is one token."""
    start = literal.index(literal[-1])
    quotes = 3 if literal[start : start + 3] == literal[-1] * 3 and len(literal) >= start + 6 else 1
    raw = "r" in literal[:start].lower()
    begin, end = start + quotes, len(literal) - quotes
    for first, last in fields_of(literal, begin, end, raw):
        before = literal[:first]
        rows = before.count("\n")
        at = first - (before.rindex("\n") + 1) if rows else column + first
        for token in names_in("(%s)" % literal[first:last], line + rows, at - 1):
            yield token


def fields_of(text, begin, end, raw, in_spec=False):
    """The ranges of the expressions in an f-string's text, those of format specifications included."""
    out = []
    at = begin
    while at < end:
        two = text[at : at + 2]
        if not raw and two == "\\N" and text[at + 2 : at + 3] == "{":
            at = text.index("}", at) + 1
        elif not raw and text[at] == "\\" and two != "\\{":
            at += 2
        elif two in ("{{", "}}") and not in_spec:
            at += 2
        elif text[at] == "{":
            at = one_field(text, at + 1, end, raw, out)
        elif text[at] == "}" and in_spec:
            break
        else:
            at += 1
    if in_spec:
        out.append(at)
    return out


def one_field(text, begin, end, raw, out):
    """Adds the ranges of the field whose expression begins here; gives the place behind its bracket."""
    depth, at, quote = 0, begin, ""
    while at < end:
        char = text[at]
        if quote:
            if text.startswith(quote, at):
                at += len(quote) - 1
                quote = ""
        elif char in "'\"":
            quote = char * 3 if text.startswith(char * 3, at) else char
            at += len(quote) - 1
        elif char in "([{":
            depth += 1
        elif depth and char in ")]}":
            depth -= 1
        elif depth == 0 and text.startswith("!=", at):
            at += 1
        elif depth == 0 and char in "!:}":
            break
        elif depth == 0 and char == "=" and text[at + 1 : at + 2] == "=":
            at += 1
        elif depth == 0 and char == "=" and text[at - 1 : at] not in tuple("<>!="):
            if text[at + 1 :].lstrip()[:1] in tuple("!:}"):
                break
        at += 1
    out.append((begin, at))
    while text[at] not in "!:}":
        at += 1
    if text[at] == "!":
        while text[at] not in ":}":
            at += 1
    if text[at] == ":":
        inner = fields_of(text, at + 1, end, raw, True)
        at = inner.pop()
        out.extend(inner)
    return at + 1


# ---- the names of a tree in the order of the source ----


def place_of_argument(node):
    value = node.value if isinstance(node, ast.keyword) else node
    return value.lineno, value.col_offset


class Walk(object):
    """One file: goes through the tree and the tokens at the same time."""

    def __init__(self, tree, tokens, keywords):
        self.tokens = tokens
        self.keywords = keywords
        self.at = 0
        self.names = []
        self.scopes = []
        self.strings = []
        self.spread = []
        self.unwritten = []
        self.marks = ""
        self.open("module", "", None)
        self.visit(tree)
        self.skip_keywords(None)
        if self.at < len(tokens):
            token = tokens[self.at]
            raise Unlike("line %d: %s is in no tree" % (token.line, token.text))

    # -- scopes --

    def open(self, kind, name, node, first_line=None):
        parent = self.scope if self.scopes else None
        line = first_line or getattr(node, "lineno", 1)
        column = getattr(node, "col_offset", 0)
        self.scopes.append([kind, name, parent, line, getattr(node, "end_lineno", None), column])
        self.scope = len(self.scopes) - 1

    def close(self):
        self.scope = self.scopes[self.scope][2]

    def inside(self, scope, node):
        """Visits something that belongs to another scope than what it stands in."""
        before, self.scope = self.scope, scope
        self.visit(node)
        self.scope = before

    # -- tokens --

    def skip_keywords(self, wanted):
        while self.at < len(self.tokens):
            text = self.tokens[self.at].text
            if text == wanted or text not in self.keywords:
                return
            self.at += 1

    def take(self, text):
        """The next name of the source, which has to be this one."""
        self.skip_keywords(text)
        if self.at >= len(self.tokens):
            raise Unlike("%s is not in the source" % text)
        token = self.tokens[self.at]
        spelled = token.text if OLD else unicodedata.normalize("NFKC", token.text)
        if spelled != text:
            raise Unlike("line %d: %s in the tree, %s in the source" % (token.line, text, token.text))
        self.at += 1
        return token

    def name(self, text, what, marks="", receiver=-1):
        """Adds a name; gives its index."""
        token = self.take(text)
        self.names.append([token, what, marks + self.marks, receiver, self.scope])
        return len(self.names) - 1

    # -- nodes --

    def visit(self, node):
        """Visits a node, a list of them, or None; gives the index of the name that it is, or -1."""
        if node is None:
            return -1
        if isinstance(node, list):
            for item in node:
                self.visit(item)
            return -1
        method = getattr(self, "visit_" + node.__class__.__name__, None)
        if method is None:
            for child in ast.iter_child_nodes(node):
                self.visit(child)
            return -1
        found = method(node)
        return -1 if found is None else found

    def marked(self, mark, node):
        """Visits what stands in an annotation, a decorator or a base."""
        before = self.marks
        if mark not in before:
            self.marks = before + mark
        self.visit(node)
        self.marks = before

    def unmarked(self, node):
        """Visits what is no decorator or base itself, but a part of one."""
        before = self.marks
        self.marks = before.replace("d", "").replace("b", "")
        found = self.visit(node)
        self.marks = before
        return found

    def in_brackets(self, node):
        before = self.marks
        self.marks = before.replace("d", "").replace("b", "")
        for child in ast.iter_child_nodes(node):
            self.visit(child)
        self.marks = before

    visit_List = visit_Set = in_brackets

    def visit_Subscript(self, node):
        self.visit(node.value)
        self.unmarked(node.slice)

    def visit_Slice(self, node):
        if OLD and isinstance(node.step, ast.Name) and node.step.id == "None":
            # `a[::]` has a step that nobody wrote.
            self.visit([node.lower, node.upper])
            self.skip_keywords("None")
            token = self.tokens[self.at] if self.at < len(self.tokens) else None
            if token and (token.text, token.line, token.column) == ("None", node.step.lineno, node.step.col_offset):
                self.visit(node.step)
            else:
                self.unwritten.append(self.scope)
            return
        self.visit([node.lower, node.upper, node.step])

    CONTEXTS = {"Load": "r", "Store": "w", "Del": "x", "Param": "p", "AugStore": "w"}

    def context(self, node, called):
        mark = self.CONTEXTS[node.ctx.__class__.__name__]
        return mark + ("c" if called else "")

    def visit_Name(self, node, called=False, extra=""):
        return self.name(node.id, "Name", self.context(node, called) + extra)

    def visit_Attribute(self, node, called=False, extra=""):
        if isinstance(node.value, (ast.Name, ast.Attribute)):
            receiver = self.unmarked(node.value)
        else:
            receiver = self.visit(node.value)
        return self.name(node.attr, "Attribute", self.context(node, called) + extra, receiver)

    def visit_Call(self, node):
        if isinstance(node.func, (ast.Name, ast.Attribute)):
            getattr(self, "visit_" + node.func.__class__.__name__)(node.func, True)
        else:
            self.visit(node.func)
        arguments = list(node.args) + list(node.keywords)
        if getattr(node, "starargs", None) is not None:
            arguments.append(node.starargs)
        if getattr(node, "kwargs", None) is not None:
            arguments.append(node.kwargs)
        self.visit_in_place(arguments)

    def visit_in_place(self, arguments):
        for argument in sorted(arguments, key=place_of_argument):
            self.unmarked(argument)

    def visit_keyword(self, node):
        if node.arg is not None:
            self.name(node.arg, "keyword")
        self.visit(node.value)

    def visit_AugAssign(self, node):
        if isinstance(node.target, (ast.Name, ast.Attribute)):
            getattr(self, "visit_" + node.target.__class__.__name__)(node.target, False, "u")
        else:
            self.visit(node.target)
        self.visit(node.value)

    def visit_AnnAssign(self, node):
        if isinstance(node.target, (ast.Name, ast.Attribute)):
            extra = "" if node.value is not None else "n"
            getattr(self, "visit_" + node.target.__class__.__name__)(node.target, False, extra)
        else:
            self.visit(node.target)
        self.annotation(node.annotation)
        self.visit(node.value)

    def annotation(self, node):
        if node is not None:
            self.marked("a", node)
            for string in strings_of_type(node):
                place = [string.lineno, string.col_offset + 1, string.end_lineno, string.end_col_offset + 1]
                self.strings.append([place, names_of_text(string.value)])

    def visit_Dict(self, node):
        for key, value in zip(node.keys, node.values):
            self.unmarked(key)
            self.unmarked(value)

    def visit_NamedExpr(self, node):
        self.unmarked(node.target)
        self.visit(node.value)

    def visit_IfExp(self, node):
        self.visit([node.body, node.test, node.orelse])

    def visit_JoinedStr(self, node):
        if node.end_lineno != node.lineno:
            self.spread.append([node.lineno, node.end_lineno])
        for value in node.values:
            if not isinstance(value, ast.Constant):
                self.visit(value)

    def comprehension(self, node, results, opens=True):
        outside = self.scope
        if opens:
            self.open("comprehension", node.__class__.__name__, node)
        before = self.marks
        self.marks = before.replace("d", "").replace("b", "")
        self.visit(results)
        for index, generator in enumerate(node.generators):
            self.visit(generator.target)
            if index == 0:
                self.inside(outside, generator.iter)
            else:
                self.visit(generator.iter)
            self.visit(generator.ifs)
        self.marks = before
        if opens:
            self.close()

    def visit_ListComp(self, node):
        self.comprehension(node, [node.elt], opens=not OLD)

    def visit_SetComp(self, node):
        self.comprehension(node, [node.elt])

    def visit_GeneratorExp(self, node):
        self.comprehension(node, [node.elt])

    def visit_DictComp(self, node):
        self.comprehension(node, [node.key, node.value])

    # -- definitions --

    def parameters(self, arguments, outside, annotations):
        """Parameters belong to the scope that is open, defaults and annotations to others."""
        inside = self.scope

        def default_of(value):
            if value is not None:
                self.inside(outside, value)

        def parameter(node, what="arg"):
            if node is None:
                return
            if OLD:
                if isinstance(node, str):
                    self.name(node, what)
                    return
                first = len(self.names)
                self.visit(node)
                for name in self.names[first:]:
                    name[1] = "arg"  # also those of `def f((a, b)):`
                return
            self.name(node.arg, what)
            if node.annotation is not None:
                self.scope = annotations
                self.annotation(node.annotation)
                self.scope = inside

        plain = list(getattr(arguments, "posonlyargs", [])) + list(arguments.args)
        defaults = [None] * (len(plain) - len(arguments.defaults)) + list(arguments.defaults)
        for node, default in zip(plain, defaults):
            parameter(node)
            default_of(default)
        parameter(arguments.vararg, "vararg")
        for node, default in zip(getattr(arguments, "kwonlyargs", []), getattr(arguments, "kw_defaults", [])):
            parameter(node)
            default_of(default)
        parameter(arguments.kwarg, "kwarg")

    def visit_Lambda(self, node):
        outside = self.scope
        self.open("lambda", "lambda", node)
        before = self.marks
        self.marks = before.replace("d", "").replace("b", "")
        self.parameters(node.args, outside, outside)
        self.visit(node.body)
        self.marks = before
        self.close()

    def visit_FunctionDef(self, node):
        self.marked("d", node.decorator_list)
        name = self.name(node.name, node.__class__.__name__, "w")
        line = self.names[name][0].line
        outside = self.scope
        generic = bool(getattr(node, "type_params", None))
        if generic:
            self.open("type parameters", node.name, node)
            self.visit(node.type_params)
        around = self.scope
        self.open("function", node.name, node, line)
        self.parameters(node.args, outside, around)
        inside, self.scope = self.scope, around
        self.annotation(getattr(node, "returns", None))
        self.scope = inside
        self.visit(node.body)
        self.close()
        if generic:
            self.close()

    visit_AsyncFunctionDef = visit_FunctionDef

    def visit_ClassDef(self, node):
        self.marked("d", node.decorator_list)
        name = self.name(node.name, "ClassDef", "w")
        line = self.names[name][0].line
        generic = bool(getattr(node, "type_params", None))
        if generic:
            self.open("type parameters", node.name, node)
            self.visit(node.type_params)
        before, self.marks = self.marks, self.marks + "b"
        bases = set(map(id, node.bases))
        arguments = list(node.bases) + list(getattr(node, "keywords", []))

        for argument in sorted(arguments, key=place_of_argument):
            self.marks = before + ("b" if id(argument) in bases else "")
            self.visit(argument)
        self.marks = before
        self.open("class", node.name, node, line)
        self.visit(node.body)
        self.close()
        if generic:
            self.close()

    def type_parameter(self, node):
        self.name(node.name, node.__class__.__name__, "w")
        for value in (getattr(node, "bound", None), getattr(node, "default_value", None)):
            if value is not None:
                self.open("annotation", node.name, value)
                self.visit(value)
                self.close()

    visit_TypeVar = visit_ParamSpec = visit_TypeVarTuple = type_parameter

    def visit_TypeAlias(self, node):
        self.take("type")
        self.names.append([self.take(node.name.id), "TypeAlias", "w", -1, self.scope])
        if node.type_params:
            self.open("type parameters", node.name.id, node)
            self.visit(node.type_params)
        self.open("annotation", node.name.id, node)
        self.visit(node.value)
        self.close()
        if node.type_params:
            self.close()

    # -- statements with names that are no expressions --

    def alias(self, node, what):
        if node.name != "*":
            segments = node.name.split(".")
            for index, segment in enumerate(segments):
                binds = node.asname is None and index == 0
                self.name(segment, what, ("w" if binds else "") + ("." if len(segments) > 1 else ""))
        if node.asname is not None:
            self.name(node.asname, "asname", "w")

    def visit_Import(self, node):
        for alias in node.names:
            self.alias(alias, "alias")

    def visit_ImportFrom(self, node):
        for segment in (node.module or "").split("."):
            if segment:
                self.name(segment, "module")
        for alias in node.names:
            self.alias(alias, "from alias")

    def visit_Global(self, node):
        for name in node.names:
            self.name(name, node.__class__.__name__)

    visit_Nonlocal = visit_Global

    def visit_ExceptHandler(self, node):
        self.visit(node.type)
        if OLD:
            self.visit(node.name)
        elif node.name is not None:
            self.name(node.name, "ExceptHandler", "w")
        self.visit(node.body)

    def visit_Print(self, node):
        self.take("print")
        self.visit(node.dest)
        self.visit(node.values)

    # -- patterns --

    def visit_Match(self, node):
        self.take("match")
        self.visit(node.subject)
        self.visit(node.cases)

    def visit_match_case(self, node):
        self.take("case")
        self.visit([node.pattern])
        self.visit(node.guard)
        self.visit(node.body)

    def visit_MatchAs(self, node):
        self.visit(node.pattern)
        if node.name is not None:
            self.name(node.name, "MatchAs", "w")
        else:
            self.take("_")

    def visit_MatchStar(self, node):
        if node.name is not None:
            self.name(node.name, "MatchStar", "w")
        else:
            self.take("_")

    def visit_MatchMapping(self, node):
        for key, pattern in zip(node.keys, node.patterns):
            self.visit(key)
            self.visit(pattern)
        if node.rest is not None:
            self.name(node.rest, "MatchMapping", "w")

    def visit_MatchClass(self, node):
        # A class pattern looks like a call, and is one of its class.
        if isinstance(node.cls, (ast.Name, ast.Attribute)):
            getattr(self, "visit_" + node.cls.__class__.__name__)(node.cls, False, "m")
        else:
            self.visit(node.cls)
        self.visit(node.patterns)
        for name, pattern in zip(node.kwd_attrs, node.kwd_patterns):
            self.name(name, "kwd_attr")
            self.visit(pattern)


def strings_of_type(node, inside=False):
    """The strings in an annotation that stand for a whole type: alone, beside "|", and in subscripts."""
    if isinstance(node, ast.Constant) and isinstance(node.value, str):
        return [node]
    parts = []
    if isinstance(node, ast.BinOp) and isinstance(node.op, ast.BitOr):
        parts = [node.left, node.right]
    elif isinstance(node, ast.Subscript):
        name = getattr(node.value, "attr", getattr(node.value, "id", ""))
        index = getattr(node.slice, "value", node.slice) if sys.version_info < (3, 9) else node.slice
        inside = True
        parts = index.elts if isinstance(index, ast.Tuple) else [index]
        if name == "Literal":
            parts = []
        elif name == "Annotated":
            parts = parts[:1]
    elif inside and isinstance(node, (ast.Tuple, ast.List)):
        parts = node.elts
    return [string for part in parts for string in strings_of_type(part, inside)]


def names_of_text(text):
    """The names of a text and of the strings in it, sorted, where it is an expression, otherwise None."""
    try:
        # `*args: "*Ts"` is a type as well.
        tree = ast.parse(text.strip(" \t*"), mode="eval").body
    except (SyntaxError, ValueError, RecursionError, MemoryError):
        return None
    found = []
    for node in ast.walk(tree):
        if isinstance(node, ast.Name):
            found.append(node.id)
        elif isinstance(node, ast.Attribute):
            found.append(node.attr)
        elif isinstance(node, (ast.keyword, ast.arg)) and node.arg:
            found.append(node.arg)
    for string in strings_of_type(tree):
        if string is not tree:
            found += names_of_text(string.value) or []
    return sorted(found)


# ---- files ----


def read(data):
    """The text of a source as the interpreter decodes it."""
    if OLD:
        import lib2to3.pgen2.tokenize as new

        rows = iter(data.splitlines(True))
        encoding = new.detect_encoding(lambda: next(rows, b""))[0]
    else:
        encoding = tokenize.detect_encoding(io.BytesIO(data).readline)[0]
    text = data.decode(encoding)
    return text[1:] if text.startswith("\ufeff") else text


def facts_of(data, path):
    """Everything of one file."""
    table = symtable.symtable(data, path, "exec")
    tree = ast.parse(data, path)
    text = read(data)
    if OLD:
        tokens = [token for token in names_in(text)]
    else:
        tokens = list(names_in(text))
    rows = text.split("\n")
    keywords = KEYWORDS
    if OLD and "print_function" in text and any(
        isinstance(node, ast.ImportFrom) and node.module == "__future__"
        and any(alias.name == "print_function" for alias in node.names) for node in tree.body
    ):  # fmt: skip
        keywords = KEYWORDS - {"print"}
    walk = Walk(tree, tokens, keywords)
    names = []
    for token, what, marks, receiver, scope in walk.names:
        row = rows[token.line - 1]
        if row[token.column : token.column + len(token.text)] != token.text:
            raise Unlike("line %d: %s is not where its token is" % (token.line, token.text))
        column = len(row[: token.column].encode("utf-8")) + 1
        end = column + len(token.text.encode("utf-8"))
        names.append([token.line, column, end, what, marks, receiver, scope])
    return {
        "table": table_of(table), "scopes": walk.scopes, "names": names, "strings": walk.strings,
        "spread": walk.spread, "unwritten": walk.unwritten,
    }  # fmt: skip


def main():
    """Reads paths and writes what the files say."""
    warnings.simplefilter("ignore")
    sys.setrecursionlimit(20000)
    while True:
        path = sys.stdin.readline()
        if not path:
            break
        path = path.rstrip("\n")
        with open(path, "rb") as file:
            data = file.read()
        try:
            compile(data, path, "exec", 0, 1)
        except Exception as error:
            answer = {"refused": "%s: %s" % (error.__class__.__name__, error)}
        else:
            try:
                answer = facts_of(data, path)
            except Exception as error:
                answer = {"failed": "%s: %s" % (error.__class__.__name__, error)}
        sys.stdout.write(json.dumps(answer) + "\n")
        sys.stdout.flush()


if __name__ == "__main__":
    threading.stack_size(512 << 20)
    thread = threading.Thread(target=main)
    thread.start()
    thread.join()
