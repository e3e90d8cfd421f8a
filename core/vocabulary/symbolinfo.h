// The vocabulary of records: what the info half of a record looks like, how it is composed and how
// it is read back.
//
// An info string is a bare prefix (":s:"), a prefix with a detail behind it (":i:os.path"), or a
// plain equiv, the source text of an equivalent expression, with no prefix. GetInfoBytesKind tells
// which. A typed literal is kTypedLiteralPrefix, the class name, ": " and the literal's text; an
// instance of a class C, used alone, is the class's name followed by kClassInstanceSuffix.
#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

inline constexpr int64_t kPrefixLen = 3;

#define QUILLET_INFO_KIND(name, kind)                                    \
  inline constexpr char k##name##Kind = kind;                            \
  inline constexpr char k##name##PrefixBytes[] = {':', kind, ':', '\0'}; \
  inline constexpr Text k##name##Prefix{k##name##PrefixBytes, kPrefixLen};
#include "vocabulary/kinds.def"

// The kind of an info string without a prefix; no prefix has it.
inline constexpr char kPlainEquivKind = '=';
// How plain equivs are asked for where kinds are listed as text.
inline constexpr Text kPlainEquivSpec = "=";

// ":" behind the class's text, so that a literal's text can follow after a blank.
inline constexpr Text kClassInstanceSuffix = ":";
// The trailer of an element got by iterating over what stands in front.
inline constexpr Text kIterationSubscript = "[*]";

// Names of scopes, as consumers of the records use them.
inline constexpr Text kModuleScopeName = Text("");
inline constexpr Text kDefLineScopeName = "<def-line>";
inline constexpr Text kDotLineScopeName = ".<def-line>";
inline constexpr Text kScopeIndexSep = "#";
inline constexpr Text kWildcardScope = "*";
inline constexpr Text kTypingModuleSymbol = "typing";
inline constexpr Text kTypingModuleSymbolDot = "typing.";
inline constexpr Text kTypingModuleSymbolDotAny = "typing.Any";

// The instance names of the builtin classes: kTypedLiteralPrefix and the class's instance text.
inline constexpr Text kListInstanceName = ":l:list:";
inline constexpr Text kDictInstanceName = ":l:dict:";
inline constexpr Text kSetInstanceName = ":l:set:";
inline constexpr Text kTupleInstanceName = ":l:tuple:";
inline constexpr Text kStringInstanceName = ":l:str:";
inline constexpr Text kUnicodeInstanceName = ":l:unicode:";
inline constexpr Text kBytesInstanceName = ":l:bytes:";
inline constexpr Text kIntLiteralName = ":l:int:";
inline constexpr Text kFloatLiteralName = ":l:float:";

// ---- composing ----

// Each appends to `out`, so that a caller composes in one buffer.

// The info text of an instance of the class that the dotted text names: the text and
// kClassInstanceSuffix.
void AppendInstanceNameForClass(Text cls_name, std::string& out);
// The typed literal of a class, with the literal's text behind ": " unless it is none.
void AppendLiteralInfo(Text cls_name, Text literal, std::string& out);
// A string literal's token text in the form it has inside an info string: a literal of the same value
// on one line and without ASCII control characters. Line ends and control characters become the
// escapes that string literals have for them, an escaped line end disappears as its value does, and a
// raw literal that holds such characters loses its "r" and has its backslashes doubled. A literal
// without control characters is left as it is. In an f-string, a line end inside a field becomes a
// blank.
void AppendEncodedStringLiteral(Text token_text, std::string& out);
// The name under which a parameter is recorded that is known by its place alone: kArgPrefix and the
// index in decimal, then a blank and `info` unless that is none.
void AppendArgInfo(int64_t index, Text info, std::string& out);
// Tokens of an expression joined as a person would write it (a + b, not x, f(b=1), x[1:2], -x). An
// item may be a text that was itself joined before. The result tokenises back to the tokens of the
// items, whatever they are; only comments, line ends and strings that are not closed, which swallow
// what stands behind them, cannot be joined.
void AppendJoinedTokens(const Text* items, size_t count, std::string& out);
// The same for a caller who knows what the items are: `codes` has the token code of each, or
// tok::ERRORTOKEN for an item of more than one token.
void AppendJoinedTokens(const Text* items, const TokenCode* codes, size_t count, std::string& out);
// A scope name in its shortest form. A dotted part may carry the index of its definition: "name#1" is
// the second of that name, "name" and "name#0" are both the first; the "#0" is dropped.
std::string EnsureScopeNameIndicies(Text name);

// ---- reading ----

inline char GetInfoBytesKind(Text info) {
  return info.size() >= 2 && info[0] == ':' && info[1] != '\0' ? info[1] : kPlainEquivKind;
}
inline Text DetailOfInfo(Text info) {
  return GetInfoBytesKind(info) == kPlainEquivKind ? info : info.substr(info.size() < 3 ? info.size() : 3);
}
// The name of the constants of a kind without "k" and "Kind", such as "FromImport"; "PlainEquiv"
// for kPlainEquivKind; empty for a byte that is no kind.
Text NameOfInfoKind(char kind);

// An info string taken apart. `first` and `second` are views into it, none where the form has no such
// part:
//   Set, Get, Global, Nonlocal        -
//   WithinExpr                        first: the token index, in decimal
//   Called                            first: "(" + argument texts joined by "," + ")"
//   Import, ImportAsName              first: the module, the name behind `as`
//   FromImport                        first: the module; second: the imported name or "*"
//   TypeParameter                     first: "*", "**" or none; second: the bound or default
//   ExpressionEquiv, TypeHint         first: the text
//   TypedLiteral                      first: the class; second: the literal's text
//   Arg                               first: the index, in decimal; second: info behind it
//   Instance (plain, by its suffix)   first: the class
//   YieldFrom ("from " in front)      first: the info string that follows
//   PlainEquiv                        first: the text
//   any other kind                    first: what stands behind the prefix
struct DecodedInfo {
  Text kind;  // a name as NameOfInfoKind gives it, or "YieldFrom"; empty for a byte that is no kind
  Text first = kNoText;
  Text second = kNoText;
};
DecodedInfo DecodeInfo(Text info);

inline bool IsDefKind(char kind) { return kind == kFunctionKind || kind == kMethodKind || kind == kUnboundMethodKind; }
inline bool IsDefLineScope(Text scope) { return scope.ends_with(kDotLineScopeName); }
// Only lengths are compared: the caller knows that one contains the other. Lengths are in
// characters at the host's surface, which passes them in.
inline bool IsParentOfDefLineScope(size_t maybe_parent_length, size_t def_line_scope_length) {
  return maybe_parent_length + kDotLineScopeName.size() == def_line_scope_length;
}
inline bool IsTopLevelModuleScope(Text scope) { return scope.empty(); }

struct CKindFilter {
  std::array<int32_t, 256> flags{};
  bool KindMatches(char kind) const { return flags[static_cast<uint8_t>(kind)] != 0; }
};

}  // namespace quillet
