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

namespace quillet {

inline constexpr int64_t kPrefixLen = 3;

#define QUILLET_INFO_KIND(name, kind)                                      \
  inline constexpr char k##name##Kind = kind;                              \
  inline constexpr char k##name##PrefixBytes[] = {':', kind, ':', '\0'};   \
  inline constexpr Text k##name##Prefix{k##name##PrefixBytes, kPrefixLen};
#include "siblings/symbolinfo/kinds.def"

// The kind of an info string without a prefix; no prefix has it.
inline constexpr char kPlainEquivKind = '=';

// ":" behind the class's text, so that a literal's text can follow after a blank.
inline constexpr Text kClassInstanceSuffix = ":";
// The trailer of an element got by iterating over what stands in front.
inline constexpr Text kIterationSubscript = "[*]";

// Names of scopes, as consumers of the records use them.
inline constexpr Text kModuleScopeName = "";
inline constexpr Text kDefLineScopeName = "<def-line>";
inline constexpr Text kDotLineScopeName = ".<def-line>";
inline constexpr Text kScopeIndexSep = "#";
inline constexpr Text kWildcardScope = "*";
inline constexpr Text kTypingModuleSymbol = "typing";

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
// A string literal's token text in the form it has inside an info string: one line, control
// characters escaped as the host's string literals escape them.
void AppendEncodedStringLiteral(Text token_text, std::string& out);
// The name of the parameter at `index` where it is not known by name, followed by `info` unless
// that is none: kArgPrefix and the index in decimal.
void AppendArgInfo(int64_t index, Text info, std::string& out);
// Tokens of an expression joined as a person would write it (a + b, not x, f(b=1), x[1:2], -x).
// The result tokenises back to the same tokens.
void AppendJoinedTokens(const Text* tokens, size_t count, std::string& out);
// A scope name with the index of its definition: "name" is "name", and "name#1" the second of that
// name. A first definition's "#0" is dropped.
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

inline bool IsDefKind(char kind) {
  return kind == kFunctionKind || kind == kMethodKind || kind == kUnboundMethodKind;
}
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
