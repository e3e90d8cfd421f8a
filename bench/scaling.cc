// quillet_scaling: whether the time and the memory that an analysis takes grow as its input does.
//
// Inputs are made to do harm: one text that repeats (nested, left open, cut apart in the middle), at a
// size and at four times that size. Each is analysed as 3.12 and as 2.7, cut into records and written in
// each format and as an index's words, in a process of its own, on a thread with a small stack. What costs more a byte
// at the larger size, costs more than any honest input does, or ends the process, is named; exit code 1 then. The last
// phases make the tree and the text of each statement, and the lines embedded in it; the statements and expressions of
// all of it at once; the occurrences of its names; and the answers of a workspace of this file alone, asked at places
// from its beginning to its end.
//
//   quillet_scaling                     the list below
//   quillet_scaling --pairs             all pairs of fragments, repeated
//   quillet_scaling --random N [SEED]   N random sequences of fragments, repeated, half of them behind a front
//   --count N                           each unit of the list N times, once: whether it ends, whatever it costs
//   --phases NAME,...                   these columns alone (output needs 3.12)
//   --slow SECONDS                      names the questions to a workspace that take longer
//   --seconds N                         ends an input of a count behind so many
//   --write PATH                        writes the input that --only names, at a count, and measures nothing
//   --size KIB, --stack KIB, --only TEXT, --list
//
// Time is that of the processor. It is taken again where it looks bad, since other processes disturb it.
#include <pthread.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fstream>
#include <functional>
#include <random>
#include <string>
#include <vector>

#include "foundations/console.h"
#include "index/words.h"
#include "names/binder.h"
#include "output/json_lines.h"
#include "output/text_lines.h"
#include "syntax/reader.h"
#include "tests/core/support/small_library.h"
#include "workspace/questions.h"

namespace quillet::bench {
namespace {

// front, `unit` n times, middle, `back` n times, end. A byte of 1 in a unit stands for its number.
struct Shape {
  std::string name;
  std::string front;
  std::string unit;
  std::string middle = {};
  std::string back = {};
  std::string end = "\n";
};

size_t CountFor(const Shape& shape, size_t size) {
  return std::max<size_t>(1, size / std::max<size_t>(1, shape.unit.size() + shape.back.size()));
}

std::string Make(const Shape& shape, size_t count) {
  std::string text = shape.front;
  const auto repeat = [&](const std::string& unit) {
    for (size_t i = 0; i < count; ++i) {
      for (const char c : unit) c == '\1' ? text.append(std::to_string(i)) : text.append(1, c);
    }
  };
  repeat(shape.unit);
  text += shape.middle;
  repeat(shape.back);
  return text += shape.end;
}

const std::vector<Shape>& Shapes() {
  static const std::string nul(1, '\0');
  static const std::vector<Shape> shapes = {
      // brackets
      {"parentheses", "x = ", "(", "a", ")"},
      {"list displays", "x = ", "[", "a", "]"},
      {"set displays", "x = ", "{", "a", "}"},
      {"dictionaries in keys", "x = ", "{", "a", ": b}"},
      {"dictionaries in values", "x = ", "{a: ", "b", "}"},
      {"tuples of one", "x = ", "(", "a", ",)"},
      {"calls in calls", "x = ", "f(", "a", ")"},
      {"calls in keywords", "x = ", "f(a=", "b", ")"},
      {"subscripts in subscripts", "x = ", "a[", "b", "]"},
      {"slices in slices", "x = ", "a[b:", "c", "]"},
      {"nested targets", "", "(", "a", ")", " = b\n"},
      {"nested tuple targets", "", "(a, ", "b", ")", " = c\n"},
      {"nested list targets", "", "[a, ", "b", "]", " = c, d\n"},
      {"nested targets of for", "for ", "(a, ", "b", ")", " in c: pass\n"},
      {"nested targets of with", "with a as ", "(a, ", "b", ")", ": pass\n"},
      {"nested targets of del", "del ", "(a, ", "b", ")"},
      {"nested tuple values", "a, b = ", "(a, ", "b", ")"},
      {"unclosed (", "", "("},
      {"unclosed [", "", "["},
      {"unclosed {", "", "{"},
      {"unclosed ( on lines", "", "(\n"},
      {"unclosed calls", "", "f("},
      {"unclosed calls on lines", "", "f(\n"},
      {"stray )", "", ")"},
      {"stray ) on lines", "", ")\n"},
      {"mixed brackets", "", "([{"},
      {"wrong closers", "", "(]"},
      {"def left open", "", "f(\ndef g(\n"},
      {"def left open, names", "", "f\1(\ndef g\1(\n"},
      {"class left open", "", "f(\nclass g(\n"},
      {"import left open", "", "f(\nimport g(\n"},
      {"from import left open", "", "from a import (\n"},
      {"with left open", "", "with (\n"},
      {"with left open in names", "", "with (a as\n"},
      {"if left open", "", "if (\n"},
      {"one def left open, deeper lines", "def f(\n", " def g(\n"},
      {"strings left open in a call", "f(\n", "'\n"},
      {"return left open", "", "return [\n"},
      {"def left open deeper and deeper", "", "f(\n  def g(\n"},
      {"async def left open", "", "async def f(\n"},
      {"async left open", "f(\n", "async \n"},
      // operators
      {"unary minus", "x = ", "-", "a"},
      {"unary mix", "x = ", "-+~", "a"},
      {"not", "x = ", "not ", "a"},
      {"await", "async def f(): ", "await ", "a"},
      {"sum", "x = a", " + a"},
      {"sum of names", "x = a", " + a\1"},
      {"product", "x = a", "*a"},
      {"power", "x = a", "**a"},
      {"and or", "x = a", " and b or c"},
      {"comparisons", "x = a", " < a"},
      {"not in", "x = a", " not in a"},
      {"is not", "x = a", " is not a"},
      {"shifts", "x = a", "<<a"},
      {"conditionals", "x = a", " if b else c"},
      {"conditionals in brackets", "x = ", "(a if b else ", "c", ")"},
      {"walrus", "x = ", "(a := ", "b", ")"},
      {"lambda", "x = ", "lambda: ", "a"},
      {"lambda with parameters", "x = ", "lambda a, b=c: ", "a"},
      {"lambda in defaults", "x = ", "lambda a=", "b", ": c"},
      {"lambda colons open", "", "lambda "},
      {"lambda left open", "x = ", "lambda a="},
      {"chained assignment", "", "a = ", "b"},
      {"chained assignment of names", "", "a\1 = ", "b"},
      {"chained targets and a tuple", "", "a, b = ", "c, d"},
      {"augmented", "", "a += ", "b"},
      {"annotations", "", "a: b\n"},
      {"annotation chain", "", "a: ", "b"},
      {"stars", "x = ", "*", "a"},
      {"star targets", "", "*a, ", "b = c"},
      {"double stars", "f(", "**", "a", "", ")\n"},
      {"backquotes", "", "`", "a", "`"},
      {"arrows", "", "->"},
      {"dots", "", ". "},
      {"ellipses", "", "..."},
      {"commas", "", ","},
      {"colons", "", ":"},
      {"equal signs", "", "= "},
      {"at signs", "", "@ "},
      {"question marks", "", "?"},
      {"dollars", "x", "$"},
      // trailers
      {"attributes", "x = a", ".b"},
      {"attributes of names", "x = a", ".b\1"},
      {"attributes as a target", "a", ".b", " = c"},
      {"calls", "x = a", "()"},
      {"calls with arguments", "x = a", "(b)"},
      {"subscripts", "x = a", "[b]"},
      {"subscripted target", "a", "[b]", " = c"},
      {"attributes and calls", "x = a", ".b()"},
      {"attributes and calls with text", "x = a", ".b('c', d=e)"},
      {"attributes after brackets", "x = (a)", ".b"},
      {"attributes on lines", "x = (a", "\n.b", ")"},
      {"strings and attributes", "x = 'a'", ".b"},
      // lists
      {"list of names", "x = [", "a\1, ", "]"},
      {"list of strings", "x = [", "'a', ", "]"},
      {"list of numbers", "x = [", "1, ", "]"},
      {"set of names", "x = {", "a, ", "}"},
      {"dictionary", "x = {", "a: b, ", "}"},
      {"dictionary of strings", "x = {", "'a\1': 1, ", "}"},
      {"dictionary of spreads", "x = {", "**a, ", "}"},
      {"targets", "", "a\1, ", "b = c"},
      {"targets and values", "", "a, ", "b = ", "c, ", "d\n"},
      {"targets and lists", "", "[a], ", "b = ", "[c], ", "d\n"},
      {"arguments", "f(", "a\1, ", ")"},
      {"keyword arguments", "f(", "a\1=b, ", ")"},
      {"starred arguments", "f(", "*a, ", ")"},
      {"double starred arguments", "f(", "**a, ", ")"},
      {"generators as arguments", "f(", "a for a in b, ", ")"},
      {"isinstance", "", "isinstance(a, b)\n"},
      {"isinstance of many", "isinstance(a, (", "b\1, ", "))"},
      {"isinstance nested", "", "isinstance(a, ", "b", ")"},
      {"isinstance with a long name", "isinstance(a", ".b", ", (C, D, E))"},
      {"parameters", "def f(", "a\1, ", "): pass"},
      {"parameters with defaults", "def f(", "a\1=b, ", "): pass"},
      {"parameters with hints", "def f(", "a\1: int = b, ", "): pass"},
      {"parameters with string hints", "def f(", "a\1: 'int', ", "): pass"},
      {"parameters on lines with comments", "def f(", "a\1,  # type: int\n", "): pass"},
      {"tuple parameters", "def f(", "(a, b), ", "): pass"},
      {"nested tuple parameters", "def f(", "(a, ", "b", ")", "): pass\n"},
      {"type parameters", "def f[", "T\1, ", "](): pass"},
      {"type parameters with bounds", "class A[", "T\1: int, ", "]: pass"},
      {"type parameters nested", "def f[", "T: (def[", "a", "])", "](): pass\n"},
      {"type parameter brackets", "class A[T: ", "a[", "b", "]", "]: pass\n"},
      {"type alias", "type A[T] = ", "a[", "b", "]"},
      {"type type", "", "type a = b\n"},
      {"bases", "class A(", "B\1, ", "): pass"},
      {"decorators", "", "@a\n"},
      {"decorators of calls", "@a", "(b)", "\n"},
      {"imports", "import ", "a\1, ", "b"},
      {"imports as", "import ", "a\1 as b, ", "b"},
      {"dotted import", "import a", ".a\1"},
      {"dotted import as", "import a", ".b", " as c"},
      {"from imports", "from a import ", "a\1, ", "b"},
      {"from imports as", "from a import (", "a\1 as b, ", ")"},
      {"relative import", "from ", ".", " import a"},
      {"relative import of many", "from ", ".", " import a, b, c, d"},
      {"long module, many names", "from a", ".b", " import ", "c, ", "d\n"},
      {"future imports", "", "from __future__ import print_function\n"},
      {"future imports, many names", "from __future__ import ", "a, ", "print_function"},
      {"global", "global ", "a\1, ", "b"},
      {"nonlocal", "def f():\n nonlocal ", "a\1, ", "b"},
      {"globals on lines", "def f():\n", " global a\1\n"},
      {"nonlocals in functions", "def f():\n", " def g():\n  nonlocal a\n"},
      {"del", "del ", "a\1, ", "b"},
      {"with items", "with ", "a as b\1, ", "c: pass"},
      {"with items in parentheses", "with (", "a as b\1, ", "c): pass"},
      {"with items in parentheses, nested", "with (", "(", "a", ")", " as b): pass\n"},
      {"with items and a hint", "with ", "a as b\1, ", "c: # type: int"},
      {"with items and a tuple hint", "with ", "a as (b, c), ", "c as (b, c): # type: int, str"},
      {"with ( on lines", "", "with (a as b): pass\n"},
      {"with ((", "with ", "(", "", "", ": pass\n"},
      {"with (a) as b", "with ", "(a) as b, ", "c: pass"},
      {"except tuple", "except (", "A\1, ", "B): pass"},
      {"except as tuple", "except (", "A\1, ", "B) as e: pass"},
      {"except star", "", "except* A: pass\n"},
      {"except stars", "except ", "*", "A: pass"},
      {"print", "", "print a\n"},
      {"print to", "print ", ">>a, ", "b"},
      {"exec", "", "exec a in b\n"},
      {"assert", "", "assert a, b\n"},
      {"raise", "raise ", "a, ", "b"},
      {"return", "return ", "a, ", "b"},
      {"yield", "x = ", "(yield ", "a", ")"},
      {"yield from", "x = ", "(yield from ", "a", ")"},
      {"yields", "", "yield a\n"},
      // comprehensions
      {"comprehension clauses", "x = [a", " for a in b", "]"},
      {"comprehension conditions", "x = [a for a in b", " if a", "]"},
      {"comprehensions nested", "x = ", "[a for a in ", "b", "]"},
      {"comprehensions nested in front", "x = ", "[", "a", " for a in b]"},
      {"async comprehensions", "async def f(): x = [a", " async for a in b", "]"},
      {"comprehensions of dictionaries", "x = ", "{a: b for a in ", "b", "}"},
      {"generators", "x = ", "(a for a in ", "b", ")"},
      {"targets of comprehensions", "x = [a for ", "a\1, ", "b in c]"},
      // match
      {"match heads", "", "match a:\n"},
      {"match in brackets", "match ", "(", "a", ")", ":\n"},
      {"match words", "", "match "},
      {"case words", "", "case "},
      {"case heads", "", "case a:\n"},
      {"case in brackets", "case ", "(", "a", ")", ":\n"},
      {"case in lists", "case ", "[", "a", "]", ":\n"},
      {"case in classes", "case ", "A(", "a", ")", ":\n"},
      {"case in mappings", "case ", "{'a': ", "a", "}", ":\n"},
      {"case alternatives", "case ", "a | ", "b:"},
      {"case sequence", "case ", "a\1, ", "b:"},
      {"case as", "case ", "a as ", "b:"},
      {"case as in brackets", "case ", "(", "a", " as b)", ":\n"},
      {"case stars", "case [", "*a, ", "b]:"},
      {"case strings", "case ", "'a' ", ":"},
      {"case numbers", "case ", "1 + ", "2j:"},
      {"case minus", "case ", "-", "1:"},
      {"case dotted", "case a", ".b", ":"},
      {"case keywords", "case A(", "a\1=b, ", "):"},
      {"case mapping", "case {", "'a\1': b, ", "}:"},
      {"case guard", "case a if ", "not ", "a:"},
      {"case guards", "case a", " if a", ":"},
      {"case left open", "", "case (\n"},
      {"match left open", "", "match (\n"},
      {"match with a backslash", "match ", "\\\n", "a:"},
      {"match subscript", "match", "[a]", ": b"},
      {"match colons", "match a", ": b"},
      {"match lambda", "match ", "lambda: ", "a:"},
      {"match on one line", "match a: ", "match a: ", "b"},
      {"case on one line", "case a: ", "case a: ", "b"},
      // statements
      {"semicolons", "", ";"},
      {"semicolons with blanks", "", "; "},
      {"statements on a line", "", "a;"},
      {"assignments on a line", "", "a\1 = b; "},
      {"errors on a line", "", "a b;"},
      {"definitions on a line", "", "def f(): "},
      {"definitions on a line, ;", "", "def f(): a;"},
      {"classes on a line", "", "class A: "},
      {"heads on a line", "", "if a: "},
      {"else on a line", "", "else: "},
      {"lambda and ;", "", "lambda: a;"},
      {"comments behind ;", "", "a; #\n"},
      {"passes", "", "pass\n"},
      {"strings", "", "'a'\n"},
      {"implied concatenation", "x = ", "'a' "},
      {"implied concatenation on lines", "x = (", "'a'\n", ")"},
      {"string statement", "", "'a' "},
      {"one letter lines", "", "a\n"},
      {"names", "", "a "},
      {"numbers", "", "1 "},
      {"error lines", "", "a b\n"},
      {"error heads", "", "def\n"},
      {"definitions", "", "def f(): pass\n"},
      {"definitions of many names", "", "def f\1(a, b): pass\n"},
      {"methods", "class A:\n", " def f\1(self): self.a\1 = 1\n"},
      {"if elif", "if a: pass\n", "elif a: pass\n"},
      {"try except", "", "try: pass\nexcept A: pass\n"},
      {"async", "", "async "},
      {"async for", "", "async for a in b: pass\n"},
      // indentation
      {"blank lines", "", "\n"},
      {"CR", "", "\r"},
      {"CR LF", "", "\r\n"},
      {"LF CR", "", "\n\r"},
      {"form feeds", "", "\f"},
      {"tabs", "", "\t", "a"},
      {"blanks", "", " ", "a"},
      {"blanks in brackets", "(\n", " ", "a)"},
      {"blanks on lines in brackets", "(\n", "        \n", "a)"},
      {"deep blank lines", "", "                                                                \n"},
      {"NULs", "", nul},
      {"NULs on lines", "", nul + "\n"},
      {"NULs in a string", "'", nul, "'"},
      {"control characters", "", "\x02"},
      {"malformed UTF-8", "", "\xFF"},
      {"lone continuations", "", "\x80"},
      {"cut characters", "", "\xE2\x82"},
      {"characters of two bytes", "", "\xC3\xA9"},
      {"characters of four bytes", "", "\xF0\x9D\x94\x98"},
      {"symbols", "", "\xE2\x82\xAC"},
      {"names of two bytes", "", "\xC3\xA9 = 1\n"},
      {"BOMs", "", "\xEF\xBB\xBF"},
      // backslashes
      {"backslashes", "", "\\"},
      {"backslashes on lines", "", "\\\n"},
      {"backslashes in an expression", "x = a", " + \\\n a"},
      {"backslashes with blanks", "x = ", "\\ \n"},
      {"backslashes in brackets", "x = (", "\\\n", "a)"},
      {"backslashes in an unclosed bracket", "x = (", "\\\n"},
      {"backslashes and def", "(", "\\\ndef \\\n"},
      {"backslashes in a decorator", "@a", "\\\n"},
      {"backslash and CR", "", "\\\r"},
      // strings
      {"a string", "x = '", "a", "'"},
      {"a string of escapes", "x = '", "\\n", "'"},
      {"a string of quotes", "x = '", "\\'", "'"},
      {"a string of backslashes", "x = '", "\\\\", "'"},
      {"a string over lines", "x = '", "\\\n", "'"},
      {"a string over lines, open", "x = '", "\\\n"},
      {"strings over lines, open", "", "'\\\n"},
      {"strings over lines of both kinds, open", "", "'\\\n\"\\\n"},
      {"a triple string", "x = '''", "a\n", "'''"},
      {"a triple string, open", "x = '''", "a\n"},
      {"triple strings, open", "", "'''\n\"\"\"\n"},
      {"triple strings", "", "'''a'''\n"},
      {"two quotes", "", "''"},
      {"quotes on lines", "", "'\n"},
      {"quotes", "", "'"},
      {"both quotes", "", "'\""},
      {"quotes and backslashes", "", "'\\"},
      {"prefixes", "", "rb'"},
      {"long prefixes", "", "rbu"},
      {"unicode escapes", "x = u'", "\\u00e9", "'"},
      {"bytes", "x = b'", "\\xff", "'"},
      // formatted strings
      {"f-string fields", "x = f'", "{a}", "'"},
      {"f-string fields on lines", "x = f'''", "{a}\n", "'''"},
      {"f-strings", "", "f'{a}'\n"},
      {"f-strings in one line", "x = (", "f'{a\1}' ", ")"},
      {"f-strings in f-strings", "x = ", "f'{", "a", "}'"},
      {"f-strings left open", "", "f'{"},
      {"f-strings left open on lines", "", "f'{\n"},
      {"triple f-strings left open", "", "f'''{\n"},
      {"triple f-strings of both kinds", "", "f'''{\nf\"\"\"{\n"},
      {"formats", "x = f'{a", ":{b", "}'"},
      {"formats in formats", "x = f'{", "a:{", "b", "}", "}'\n"},
      {"f-string braces", "x = f'", "{{", "'"},
      {"f-string open braces", "x = f'", "{", "'"},
      {"f-string closed braces", "x = f'", "}", "'"},
      {"f-string brackets", "x = f'{", "(", "a", ")", "}'\n"},
      {"f-string brackets open", "x = f'{", "(", "}'"},
      {"f-string lambda", "x = f'{", "lambda: ", "a}'"},
      {"f-string conversions", "x = f'", "{a!r:>{b}}", "'"},
      {"f-string equals", "x = f'", "{a=}", "'"},
      {"f-string errors", "x = f'", "{a b}", "'"},
      {"f-string names of characters", "x = f'", "\\N{a}", "'"},
      {"f-string names left open", "x = f'", "\\N{", "'"},
      {"f-string comments", "x = f'''{", "#\n", "a}'''"},
      {"f-string colons", "x = f'{a", ":", "}'"},
      {"f-string exclamations", "x = f'{a", "!", "}'"},
      {"f-string in a line with errors", "", "f'{a}' b;"},
      {"f-string and statements", "", "f'{a}';"},
      // comments and hints
      {"comments", "", "#\n"},
      {"a comment", "#", "a"},
      {"a comment of blanks", "x = 1 #", " ", "type: int"},
      {"comments in brackets", "x = (", "#\n", "a)"},
      {"type comments in brackets", "x = (", "# type: int\n", "a)"},
      {"type comments in call", "f(", "a, # type: int\n", "a)"},
      {"type comments", "", "x = 1 # type: int\n"},
      {"type comment of many", "x = 1 # ", "type: ", "int"},
      {"type comment in brackets", "x = 1 # type: ", "[", "int", "]"},
      {"type comment of a list", "x = 1 # type: (", "int, ", ")"},
      {"type comment with an error", "x = 1 # type: ", "a ", ""},
      {"type comment and targets", "", "a, ", "b = c # type: ", "int, ", "int\n"},
      {"type comment and nested targets", "", "(a, ", "b", ")", " = c # type: int\n"},
      {"type comment and both nested", "", "(a, ", "b", ")", " = c # type: ((a, b), c)\n"},
      {"type comment behind many comments", "x = (", "# type:\n", "a) # type: int"},
      {"signature comment", "def f(a): # type: (", "int, ", ") -> int"},
      {"signature comments", "def f(a):\n", " # type: (int) -> int\n"},
      {"signature comments on functions", "", "def f(a):\n # type: (int) -> int\n pass\n"},
      {"signature comment, arrows", "def f(a): # type: ", "->", "int"},
      {"signature comment, brackets", "def f(a): # type: ", "(", "int", ")", " -> int\n"},
      {"signature comment, quotes", "def f(a): # type: (", "'a', ", ") -> int"},
      {"signature comment, open quote", "def f(a): # type: (", "'", ") -> int"},
      {"signature comment and parameters", "def f(", "a\1, ", "): # type: (", "int, ", ") -> int\n"},
      {"comments of parameters", "def f(a, # type: int\n", "b\1, # type: int\n", "): pass"},
      {"comments of parameters without commas", "def f(", "# type: int\n", "a): pass"},
      {"comment signs", "x = 1 ", "#", "type: int"},
      {"string hints", "", "x: 'int'\n"},
      {"a string hint", "x: '", "a", "'"},
      {"a string hint in brackets", "x: '", "[", "int", "]", "'\n"},
      {"string hints in brackets", "x: a[", "'b', ", "]"},
      {"string hints in brackets, nested", "x: ", "a['b', ", "c", "]"},
      {"string hints with errors", "x: a[", "'b c', ", "]"},
      {"string hints with escapes", "x: '", "\\n", "'"},
      {"cast", "x = ", "cast('int', ", "a", ")"},
      {"casts", "x = [", "cast('int', a), ", "]"},
      {"casts left open", "x = ", "cast('int', "},
      {"cast dots", "x = a", ".cast", "('int', a)"},
      {"casts with backslashes", "x = typing", "\\\n", ".cast('int', a)"},
      {"typing dots", "x = ", "typing.cast('a', \\\n", "a"},
      {"Literal", "x: ", "Literal[", "'a'", "]"},
      {"Annotated", "x: ", "Annotated['a', ", "'b'", "]"},
      {"Optional strings", "x: ", "'a' | ", "b"},
      {"return hints", "", "def f() -> 'int': pass\n"},
      // sizes of tokens
      {"a long name", "", "a"},
      {"a long name in a call", "f(", "a", ")"},
      {"a long name in a chain", "", "a", ".b.c.d.e.f = g.h.i"},
      {"a long name with an error", "", "a", " b"},
      {"a long name of high bytes", "", "\xC3\xA9"},
      {"a long number", "", "1"},
      {"a long number with underscores", "1", "_1"},
      {"underscores", "1", "_"},
      {"a long number in hex", "0x", "f"},
      {"a long number in binary", "0b", "1"},
      {"a long fraction", "x = 0.", "1"},
      {"a long exponent", "x = 1e", "1"},
      {"a long class in isinstance", "isinstance(x, ", "a", ")"},
      {"a long base", "class A(", "a", "): pass"},
      {"a long module", "import ", "a"},
      {"a long definition", "def ", "a", "(): pass"},
      {"a long keyword", "f(", "a", "=1)"},
      {"names in scopes", "", "class A\1:\n def f(self): pass\n"},
      {"long names in scopes", "class aaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaa:\n",
       " class b\1:\n  def f(self): pass\n"},
  };
  return shapes;
}

const std::vector<std::string>& Fragments() {
  static const std::vector<std::string> fragments = {
      "(",
      ")",
      "[",
      "]",
      "{",
      "}",
      ":",
      ",",
      ";",
      "\\\n",
      "\n",
      "\n ",
      "\r",
      "def f",
      "class C",
      "lambda ",
      "lambda: ",
      " if ",
      " else ",
      " for x in ",
      "async ",
      "await ",
      "x",
      "\1",
      "1",
      "'",
      "\"",
      "'''",
      "\"\"\"",
      "f'",
      "f'''",
      "f\"{",
      "'a'",
      "b'",
      "#",
      "# type: ",
      "type ",
      " = ",
      " -> ",
      "*",
      "**",
      "@",
      "match ",
      "case ",
      "with ",
      "with (",
      " as ",
      "not ",
      "yield ",
      "import ",
      "from ",
      ".",
      "...",
      ":=",
      std::string(1, '\0'),
      " ",
      "\t",
      "\f",
      "\xC3\xA9",
      "\xFF",
      "cast(",
      "isinstance(",
      "print ",
      "except ",
      "try:",
      "else:",
      "return ",
      "global x",
      " + ",
      "-",
      " in ",
      " is ",
      "|",
      "_",
      "int",
      "\\",
      "!",
      "\\N{",
      "}'",
      "pass\n",
      "typing.",
      "Literal[",
      "nonlocal x",
      "print_function",
      "__future__",
      "del ",
      "~",
      "`",
      "<>",
      "0x",
      "e",
  };
  return fragments;
}

std::string Shown(const std::string& text) {
  std::string shown;
  for (const char c : text) {
    if (c == '\n') {
      shown += "\\n";
    } else if (c >= ' ' && c < 0x7F) {
      shown += c;
    } else {
      char hex[8];
      std::snprintf(hex, sizeof hex, "\\x%02x", static_cast<unsigned char>(c));
      shown += hex;
    }
  }
  return shown;
}

// ---- one measurement, in a process of its own ----

constexpr int kPhases = 8;
constexpr const char* kPhaseNames[kPhases] = {"3.12", "2.7", "whole", "output", "text", "syntax", "names", "asked"};

struct Costs {
  double seconds[kPhases][2];
  double bytes[2];   // of the texts
  double memory[2];  // by which the process grew for one
  bool refused;      // the larger one: it takes more memory than a source may
};

FileAnalyzer::Options OptionsFor(bool py3, bool reads_completely = false) {
  const std::string folder = QUILLET_SOURCE_DIR "/resources/pgen-grammars/";
  FileAnalyzer::Options options;
  options.version = py3 ? Version::Of(3, 12) : Version::Of(2, 7);
  options.py3_grammar = py3;
  options.reads_completely = reads_completely;
  options.grammar_file = folder + (py3 ? kPy3DefaultGrammar : kPy2DefaultGrammar);
  options.hint_grammar_file = folder + kPy3DefaultGrammar;
  for (const Text keyword : py3 ? Py3Keywords() : Py27Keywords()) options.keywords.emplace_back(keyword);
  for (const Text keyword : Py3Keywords()) options.hint_keywords.emplace_back(keyword);
  return options;
}

double ProcessorSeconds() {
  timespec now;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

double PeakBytes() {
  rusage usage;
  getrusage(RUSAGE_SELF, &usage);
  return static_cast<double>(usage.ru_maxrss) * 1024;
}

// Built once, in front of the first measurement, and inherited by the processes.
struct Tools {
  FileAnalyzer py3{OptionsFor(true)};
  FileAnalyzer py2{OptionsFor(false)};
  FileAnalyzer whole{OptionsFor(true, true)};
  std::unique_ptr<FileWriter> json = MakeJsonLinesWriter({});
  std::unique_ptr<FileWriter> text = MakeTextLinesWriter({});
  std::unique_ptr<FileWriter> words = MakeWordsWriter(Version::Of(3, 12));
  RecordTableMaker tables;
  CPGenAnalyzerImpl analyzer{OptionsFor(true)};
};

Tools& TheTools() {
  static Tools tools;
  return tools;
}

// Whether something takes more memory than a source may.
bool IsRefused(const std::function<void()>& work) {
  try {
    work();
  } catch (const Error& error) {
    if (error.kind() != ErrorKind::kOverflowError) throw;
    return true;
  }
  return false;
}

void WriteAll(const FileAnalyzer& file) {
  Tools& tools = TheTools();
  ScopeNames scopes;
  scopes.Build(file);
  PlacedRecords placed;
  BatchInput input;
  input.path = "x.py";
  {
    std::string out;
    tools.json->Write(input, file, scopes, placed, out);
  }
  {
    std::string out;
    tools.text->Write(input, file, scopes, placed, out);
  }
  {
    std::string out;
    tools.words->Write(input, file, scopes, placed, out);
  }
  (void)tools.tables.Make(file, scopes, placed);
}

// Trees, embedded lines and texts by themselves, as a host asks for them.
void RenderAll(Text text) {
  CPGenParserImpl& parser = TheTools().analyzer.logical_parser();
  CNodeToTextConverter converter(true, true, true);
  const Ref<SourceText> source = SourceText::Copy(text);
  std::vector<LineRow> rows;
  CutLines(*source, Version::Of(3, 12), rows);
  for (const LineRow& row : rows) {
    LogicalLine line;
    SetFromRow(line, source, row);
    CNode* node = nullptr;
    try {
      (void)line.GetExpLogicals();
      node = parser.ParseToNode(line, true);
      if (node != nullptr) (void)converter.TextForNode(node);
    } catch (const Error&) {
    }
    if (node != nullptr) parser.DiscardNode(node);
  }
}

void ReadSyntax(Text text) {
  const Ref<SourceText> source = SourceText::Copy(text);
  for (const Version version : {Version::Of(3, 12), Version::Of(2, 7)}) {
    std::vector<LineRow> rows;
    CutLines(*source, version, rows);
    FileSyntax file;
    SyntaxReader(version).Read(*source, rows, file);
    for (uint32_t place = 0; place < text.size(); place += static_cast<uint32_t>(text.size() / 8 + 1))
      (void)file.StatementAt(place);
  }
}

void BindNames(Text text) {
  for (const Version version : {Version::Of(3, 12), Version::Of(2, 7)}) NameBinder(version).Bind(text);
}

// Questions that take longer are named on standard error; 0 for none of them.
double g_slow_seconds = 0;

void Ask(Text text) {
  constexpr uint32_t kPlaces = 4;
  Workspace::Settings settings;
  settings.roots = {"/nowhere"};
  settings.version = Version::Of(3, 12);
  settings.typeshed = testing::SmallLibrary();
  Workspace workspace(std::move(settings));
  const auto timed = [](const char* name, uint32_t at, const auto& question) {
    const double begin = ProcessorSeconds();
    (void)question();
    const double seconds = ProcessorSeconds() - begin;
    if (g_slow_seconds > 0 && seconds > g_slow_seconds) std::fprintf(stderr, "  %s at %u: %.2f s\n", name, at, seconds);
  };
  const FileId file = workspace.FileOf("/nowhere/a.py");
  timed("Open", 0, [&] {
    workspace.Open(file, std::string(text));
    return workspace.CanRead(file);
  });
  for (uint32_t i = 0; i <= kPlaces; ++i) {
    const auto place = static_cast<uint32_t>(text.size() * i / kPlaces);
    for (const uint32_t at : {place, place == 0 ? 0 : place - 1}) {
      timed("Definitions", at, [&] { return workspace.Definitions(file, at); });
      timed("TypeDefinitions", at, [&] { return workspace.TypeDefinitions(file, at); });
      timed("Declarations", at, [&] { return workspace.Declarations(file, at); });
      timed("Implementations", at, [&] { return workspace.Implementations(file, at); });
      timed("References", at, [&] { return workspace.References(file, at); });
      timed("Types", at, [&] { return workspace.Types(file, at); });
      timed("HoverAt", at, [&] { return workspace.HoverAt(file, at); });
      timed("Signatures", at, [&] { return workspace.Signatures(file, at); });
      timed("Complete", at, [&] { return workspace.Complete(file, at); });
      timed("Callers", at, [&] { return workspace.Callers(file, at); });
      timed("Callees", at, [&] { return workspace.Callees(file, at); });
      timed("Supertypes", at, [&] { return workspace.Supertypes(file, at); });
      timed("Selections", at, [&] { return workspace.Selections(file, at); });
      timed("RenameTo", at, [&] { return workspace.RenameTo(file, at, "renamed"); });
    }
  }
  timed("Outline", 0, [&] { return workspace.Outline(file); });
  timed("Problems", 0, [&] { return workspace.Problems(file); });
  timed("Folds", 0, [&] { return workspace.Folds(file); });
  timed("Colours", 0, [&] { return workspace.Colours(file); });
  timed("Hints", 0, [&] { return workspace.Hints(file); });
  timed("Symbols", 0, [&] { return workspace.Symbols("a"); });
}

// One measurement at a count, or two: at that of a size and of four times that size.
struct Amount {
  size_t size;
  size_t count;           // 0 stands for that of the size
  uint32_t phases = ~0u;  // bits by their numbers
};

Costs MeasureHere(const Shape& shape, Amount amount) {
  Costs costs{};
  Tools& tools = TheTools();
  const size_t counts[] = {amount.count != 0 ? amount.count : CountFor(shape, amount.size),
                           CountFor(shape, 4 * amount.size)};
  const int rounds = amount.count != 0 ? 1 : 2;
  for (int step = 0; step < rounds; ++step) {
    const std::string text = Make(shape, counts[step]);
    costs.bytes[step] = static_cast<double>(text.size());
    const double memory = PeakBytes();
    // The second time round memory is there.
    for (int round = 0; round < rounds; ++round) {
      bool is_analysed = false;
      const std::function<void()> phases[kPhases] = {
          [&] {
            tools.py3.Analyze(text);
            is_analysed = true;
          },
          [&] { tools.py2.Analyze(text); },
          [&] { tools.whole.Analyze(text); },
          [&] {
            if (is_analysed) WriteAll(tools.py3);
          },
          [&] { RenderAll(text); },
          [&] { ReadSyntax(text); },
          [&] { BindNames(text); },
          [&] { Ask(text); },
      };
      for (int phase = 0; phase < kPhases; ++phase) {
        if ((amount.phases >> phase & 1) == 0) continue;
        const double begin = ProcessorSeconds();
        costs.refused |= IsRefused(phases[phase]);
        costs.seconds[phase][step] = ProcessorSeconds() - begin;
      }
    }
    costs.memory[step] = PeakBytes() - memory;
  }
  return costs;
}

struct Job {
  const Shape* shape;
  Amount amount;
  int pipe;
};

void* RunJob(void* argument) {
  const Job& job = *static_cast<Job*>(argument);
  Costs costs{};
  costs = MeasureHere(*job.shape, job.amount);
  if (write(job.pipe, &costs, sizeof costs) != sizeof costs) std::perror("write");
  return nullptr;
}

unsigned g_most_seconds = 1800;  // for a count

// Empty, or what became of the process.
std::string Measure(const Shape& shape, Amount amount, size_t stack, Costs& costs) {
  int ends[2];
  if (pipe(ends) != 0) return "no pipe";
  const pid_t child = fork();
  if (child == 0) {
    close(ends[0]);
    if (amount.count != 0) alarm(g_most_seconds);
    Job job{&shape, amount, ends[1]};
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    pthread_attr_setstacksize(&attributes, stack);
    pthread_t thread;
    if (pthread_create(&thread, &attributes, RunJob, &job) != 0) _exit(3);
    pthread_join(thread, nullptr);
    _exit(0);
  }
  close(ends[1]);
  const bool has_costs = read(ends[0], &costs, sizeof costs) == sizeof costs;
  close(ends[0]);
  int status = 0;
  waitpid(child, &status, 0);
  if (WIFSIGNALED(status)) return std::string("killed: ") + strsignal(WTERMSIG(status));
  if (!has_costs) return "no result, exit code " + std::to_string(WEXITSTATUS(status));
  return {};
}

// ---- judging ----

struct Limits {
  Amount amount = {256 << 10, 0};
  size_t stack = 512 << 10;
  double growth = 2;          // of the cost of a byte, from a size to four times that size
  double least = 15;          // ns a byte: below it nothing but noise and caches make the growth
  double nanoseconds = 4000;  // of a byte
  double memory = 1000;       // bytes a byte
};

// What is wrong with the costs of a shape; empty where nothing is.
std::string Judge(const Costs& costs, const Limits& limits) {
  std::string wrong;
  if (limits.amount.count != 0) return wrong;
  char line[160];
  for (int phase = 0; phase < kPhases; ++phase) {
    const double small = costs.seconds[phase][0] / costs.bytes[0] * 1e9;
    const double large = costs.seconds[phase][1] / costs.bytes[1] * 1e9;
    if (large > limits.growth * std::max(small, limits.least) || large > limits.nanoseconds) {
      std::snprintf(line, sizeof line, " %s: %.0f -> %.0f ns a byte;", kPhaseNames[phase], small, large);
      wrong += line;
    }
  }
  const double memory = costs.memory[1] / costs.bytes[1];
  if (memory > limits.memory) {
    std::snprintf(line, sizeof line, " memory: %.0f bytes a byte;", memory);
    wrong += line;
  }
  return wrong;
}

// True where the shape is as it should be.
bool Try(const Shape& shape, const Limits& limits, bool show_all) {
  std::string wrong;
  Costs costs{};
  for (int attempt = 0; attempt < 3; ++attempt) {
    wrong = Measure(shape, limits.amount, limits.stack, costs);
    if (!wrong.empty() || costs.refused) break;
    wrong = Judge(costs, limits);
    if (wrong.empty()) break;
  }
  if (show_all || !wrong.empty()) {
    std::printf("%-44s", shape.name.c_str());
    const int last = limits.amount.count != 0 ? 0 : 1;
    const double bytes = std::max(costs.bytes[last], 1.0);
    for (int phase = 0; phase < kPhases; ++phase) std::printf(" %6.0f", costs.seconds[phase][last] / bytes * 1e9);
    std::printf(" %6.0f %s%s%s\n", costs.memory[last] / bytes, costs.refused ? "  refused: too large" : "",
                wrong.empty() ? "" : "  <--", wrong.c_str());
    std::fflush(stdout);
  }
  return wrong.empty();
}

int Main(int argc, char** argv) {
  Limits limits;
  bool pairs = false;
  size_t random_count = 0;
  unsigned seed = 1;
  std::string only, path;
  for (int i = 1; i < argc; ++i) {
    const std::string option = argv[i];
    const auto value = [&] { return i + 1 < argc ? std::strtoul(argv[++i], nullptr, 10) : 0; };
    if (option == "--pairs") {
      pairs = true;
    } else if (option == "--random") {
      random_count = value();
      if (i + 1 < argc && argv[i + 1][0] != '-') seed = static_cast<unsigned>(value());
    } else if (option == "--size") {
      limits.amount.size = value() << 10;
    } else if (option == "--count") {
      limits.amount.count = value();
    } else if (option == "--stack") {
      limits.stack = value() << 10;
    } else if (option == "--only" && i + 1 < argc) {
      only = argv[++i];
    } else if (option == "--write" && i + 1 < argc) {
      path = argv[++i];
    } else if (option == "--phases" && i + 1 < argc) {
      const std::string wanted = std::string(",") + argv[++i] + ",";
      limits.amount.phases = 0;
      for (int phase = 0; phase < kPhases; ++phase)
        if (wanted.find(std::string(",") + kPhaseNames[phase] + ",") != std::string::npos)
          limits.amount.phases |= 1u << phase;
    } else if (option == "--seconds") {
      g_most_seconds = static_cast<unsigned>(value());
    } else if (option == "--slow" && i + 1 < argc) {
      g_slow_seconds = std::strtod(argv[++i], nullptr);
    } else if (option == "--list") {
      for (const Shape& shape : Shapes()) std::printf("%-44s %s\n", shape.name.c_str(), Shown(shape.unit).c_str());
      return 0;
    } else {
      std::fprintf(stderr,
                   "usage: quillet_scaling [--pairs | --random N [SEED]] [--size KIB | --count N] [--stack KIB] "
                   "[--only TEXT] [--phases NAME,...] [--slow SECONDS] [--seconds N] [--write PATH] [--list]\n");
      return 2;
    }
  }
  if (!path.empty()) {
    const auto shape = std::ranges::find(Shapes(), only, &Shape::name);
    if (shape == Shapes().end()) return 2;
    std::ofstream(path, std::ios::binary) << Make(*shape, limits.amount.count);
    return 0;
  }
  TheConsole().print_line = [](Text) {};
  TheConsole().report_exception = [](const std::exception_ptr&, bool) {};
  TheTools();
  testing::SmallLibrary();

  size_t tried = 0, bad = 0;
  std::printf("%-44s", "input");
  for (const char* phase : kPhaseNames) std::printf(" %6s", phase);
  std::printf(" %6s\n", "memory");
  const auto run = [&](const Shape& shape, bool show_all) {
    ++tried;
    bad += !Try(shape, limits, show_all);
  };
  if (pairs) {
    for (const std::string& first : Fragments()) {
      for (const std::string& second : Fragments())
        run({Shown(first) + " " + Shown(second), "", first + second}, false);
    }
  } else if (random_count != 0) {
    std::mt19937 random(seed);
    const auto fragment = [&] { return Fragments()[random() % Fragments().size()]; };
    for (size_t i = 0; i < random_count; ++i) {
      Shape shape{"", "", ""};
      if (random() % 2) shape.front = fragment() + fragment();
      for (size_t left = 1 + random() % 5; left > 0; --left) shape.unit += fragment();
      shape.name = "(" + Shown(shape.front) + ") " + Shown(shape.unit);
      run(shape, false);
    }
  } else {
    for (const Shape& shape : Shapes()) {
      if (shape.name.find(only) != std::string::npos) run(shape, true);
    }
  }
  std::printf("%zu inputs, %zu of them bad (ns a byte by phase; bytes of memory a byte)\n", tried, bad);
  return bad == 0 ? 0 : 1;
}

}  // namespace
}  // namespace quillet::bench

int main(int argc, char** argv) { return quillet::bench::Main(argc, argv); }
