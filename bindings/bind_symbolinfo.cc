// The sibling module symbolinfo: the vocabulary of records, how they are composed and read back.
//
// Prefixes and what else is part of an info string are bytes; a kind is the int of its byte; scope
// names are str.
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/utf8_arg.h"
#include "foundations/strutils.h"
#include "vocabulary/symbolinfo.h"

namespace quillet::host {
namespace {

int KindNumber(char kind) { return static_cast<unsigned char>(kind); }

void BindConstants(nb::module_& m) {
#define QUILLET_INFO_KIND(name, kind)                    \
  m.attr("k" #name "Prefix") = BytesOf(k##name##Prefix); \
  m.attr("k" #name "Kind") = KindNumber(k##name##Kind);
#include "vocabulary/kinds.def"
  m.attr("kPlainEquivKind") = KindNumber(kPlainEquivKind);
  m.attr("kPlainEquivSpec") = BytesOf(kPlainEquivSpec);
  m.attr("kPrefixLen") = kPrefixLen;
  m.attr("kIterationSubscript") = BytesOf(kIterationSubscript);
  m.attr("kClassInstanceSuffix") = StrOf(kClassInstanceSuffix);

  m.attr("kScopeIndexSep") = StrOf(kScopeIndexSep);
  m.attr("kModuleScopeName") = StrOf(kModuleScopeName);
  m.attr("kWildcardScope") = StrOf(kWildcardScope);
  m.attr("kDefLineScopeName") = StrOf(kDefLineScopeName);
  m.attr("_kDotLineScopeName") = StrOf(kDotLineScopeName);

  m.attr("kTypingModuleSymbol") = BytesOf(kTypingModuleSymbol);
  m.attr("kTypingModuleSymbolDot") = BytesOf(kTypingModuleSymbolDot);
  m.attr("kTypingModuleSymbolDotAny") = BytesOf(kTypingModuleSymbolDotAny);
  m.attr("kTypingModuleSymbolStr") = StrOf(kTypingModuleSymbol);
  m.attr("kTypingModuleSymbolDotStr") = StrOf(kTypingModuleSymbolDot);
  m.attr("kTypingModuleSymbolDotAnyStr") = StrOf(kTypingModuleSymbolDotAny);
}

// ---- composing ----

nb::object LiteralInfo(nb::handle cls_name, nb::handle literal) {
  const HostText name = HostText::FromStrOrBytes(cls_name);
  const HostText text = HostText::FromStrOrBytes(literal, true);
  std::string info;
  AppendLiteralInfo(name.text(), text.text(), info);
  return BytesOf(info);
}

nb::object InstanceName(nb::handle cls_name) {
  const HostText name = HostText::FromStrOrBytes(cls_name);
  std::string info;
  AppendInstanceNameForClass(name.text(), info);
  return PyBytes_Check(cls_name.ptr()) ? BytesOf(info) : StrOf(info);
}

nb::object EncodedLiteral(nb::handle text) {
  const HostText literal = HostText::FromStrOrBytes(text);
  std::string encoded;
  AppendEncodedStringLiteral(literal.text(), encoded);
  return BytesOf(encoded);
}

nb::object ArgInfo(nb::handle index, nb::handle info) {
  const int64_t place = Int64Of(index);
  const HostText text = HostText::FromStrOrBytes(info, true);
  std::string name;
  AppendArgInfo(place, text.text(), name);
  return BytesOf(name);
}

nb::object Joined(nb::handle tokens) {
  const nb::object tuple = TupleOf(tokens);
  const auto count = static_cast<size_t>(PyTuple_GET_SIZE(tuple.ptr()));
  std::vector<HostText> kept;
  std::vector<Text> items;
  kept.reserve(count);
  items.reserve(count);
  for (size_t i = 0; i < count; ++i) {
    kept.push_back(HostText::FromStrOrBytes(PyTuple_GET_ITEM(tuple.ptr(), static_cast<Py_ssize_t>(i))));
    items.push_back(kept.back().text());
  }
  std::string joined;
  AppendJoinedTokens(items.data(), count, joined);
  return BytesOf(joined);
}

void BindComposing(nb::module_& m) {
  m.def("BuildLiteralInfo", &LiteralInfo, nb::arg("cls_name").none(), nb::arg("literal").none(),
        "The typed literal of a class, as bytes: kTypedLiteralPrefix, the class and, unless it is None, the\n"
        "literal's text behind \": \".");
  m.def("GetInstanceNameForClass", &InstanceName, nb::arg("cls_name").none(),
        "The info text of an instance of the class that a dotted name names: the name and\n"
        "kClassInstanceSuffix. str for str, bytes for bytes.");
  m.def(
      "EnsureScopeNameIndicies",
      [](nb::handle name) { return StrOf(EnsureScopeNameIndicies(HostText::FromStr(name).text())); },
      nb::arg("name").none(),
      "A scope name in its shortest form: of \"f#0\", the first definition of that name, \"f\" is left.");
  m.def("EncodeStringLiteral", &EncodedLiteral, nb::arg("text").none(),
        "A string literal's text as a literal of the same value on one line, without control characters, as\nbytes.");
  m.def("BuildArgInfo", &ArgInfo, nb::arg("index"), nb::arg("info").none(),
        "The name of a parameter that is known by its place alone, counted from 0, followed by `info` (bytes)\n"
        "unless that is None.");
  m.def("JoinTokens", &Joined, nb::arg("tokens"),
        "Tokens of an expression (str or bytes) joined as a person would write it, as bytes.\n\nAn item may be a text "
        "that was joined before. The result tokenises back to the same tokens.");
}

// A buffer in which info strings are put together.
class InfoBytesBuilder {
 public:
  void Clear() { bytes_.clear(); }
  void Append(nb::handle piece) { bytes_ += HostText::FromStrOrBytes(piece).text(); }
  void AppendInteger(nb::handle number) { quillet::AppendInteger(Int64Of(number), bytes_); }
  nb::object GetBytes() const { return BytesOf(bytes_); }

 private:
  std::string bytes_;
};

void BindBuilder(nb::module_& m) {
  nb::class_<InfoBytesBuilder>(m, "CInfoBytesBuilder", "Puts an info string together piece by piece.")
      .def(nb::init<>())
      .def("Clear", &InfoBytesBuilder::Clear, "Drops what was appended.")
      .def("Append", &InfoBytesBuilder::Append, nb::arg("piece"), "Appends a str, as UTF-8, or bytes.")
      .def("AppendInteger", &InfoBytesBuilder::AppendInteger, nb::arg("number"), "Appends an int in decimal.")
      .def("GetBytes", &InfoBytesBuilder::GetBytes, "What was appended, as bytes.");
  m.attr("gInfoBytesBuilder") = nb::cast(new InfoBytesBuilder, nb::rv_policy::take_ownership);
}

// ---- reading ----

// The length of a str in characters; what has no length fails as len() does.
size_t LengthOfStr(nb::handle text) {
  if (PyUnicode_Check(text.ptr())) return static_cast<size_t>(PyUnicode_GET_LENGTH(text.ptr()));
  if (PyObject_Size(text.ptr()) < 0) throw nb::python_error();
  ThrowExpected("str", text);
}

// A detail of digits as the number it is.
nb::object IndexOf(Text digits) {
  nb::object text = StrOf(digits);
  if (digits.empty() || digits.find_first_not_of("0123456789") != Text::npos) return text;
  nb::object number = nb::steal(PyLong_FromUnicodeObject(text.ptr(), 10));
  if (number.is_valid()) return number;
  PyErr_Clear();  // longer than the host converts
  return text;
}

nb::object Decoded(Text info) {
  const DecodedInfo decoded = DecodeInfo(info);
  nb::object detail;
  if (decoded.kind == "YieldFrom") {
    // Only the outermost word is taken off, so a text of many is no deep recursion.
    const DecodedInfo inner = DecodeInfo(decoded.first);
    detail = inner.kind == "YieldFrom" ? StrOf(decoded.first) : Decoded(decoded.first);
  } else if (decoded.kind == "WithinExpr") {
    detail = IndexOf(decoded.first);
  } else if (decoded.kind == "Arg") {
    detail = nb::make_tuple(IndexOf(decoded.first), BytesOf(decoded.second));
  } else if (decoded.kind == "FromImport" || decoded.kind == "TypedLiteral" || decoded.kind == "TypeParameter") {
    detail = nb::make_tuple(StrOf(decoded.first), StrOf(decoded.second));
  } else {
    detail = StrOf(decoded.first);
  }
  return nb::make_tuple(StrOf(decoded.kind.empty() ? Text("Unknown") : decoded.kind), detail);
}

constexpr const char* kDecodeInfoDoc =
    R"(An info string taken apart: the name of its kind and its detail.

The name is that of the constants without "k" and "Kind", "YieldFrom" for what stands behind "from ", and
"Unknown" for a byte that is no kind. The detail is

    None                            Set, Get, Global, Nonlocal
    int, the token index            WithinExpr
    (module, name or "*")           FromImport
    (class, literal's text or None) TypedLiteral
    (stars or None, bound or None)  TypeParameter
    (index, info bytes or None)     Arg
    (kind, detail) of what follows  YieldFrom
    str                             all others)";

// 256 flags, one a kind.
void SetFlags(CKindFilter& filter, nb::handle kinds) {
  for (nb::handle kind : nb::iter(kinds)) filter.flags[static_cast<unsigned char>(ByteOf(kind))] = 1;
}

void BindReading(nb::module_& m) {
  m.def(
      "GetInfoBytesKind",
      [](nb::handle ibytes) { return KindNumber(GetInfoBytesKind(HostText::FromBytes(ibytes).text())); },
      nb::arg("ibytes_ptr").none(), "The kind of an info string, as int; kPlainEquivKind without a prefix.");
  m.def(
      "DecodeInfo", [](nb::handle info) { return Decoded(HostText::FromBytes(info).text()); }, nb::arg("info").none(),
      kDecodeInfoDoc);
  m.def(
      "IsDefKind", [](nb::handle kind) { return IsDefKind(ByteOf(kind)); }, nb::arg("kind"),
      "Whether a kind is that of a function, a method or an unbound method.");
  m.def(
      "IsDefLineScope", [](nb::handle scope) { return IsDefLineScope(HostText::FromStr(scope).text()); },
      nb::arg("scope").none(), "Whether a scope is that of a def line, by the end of its name.");
  m.def(
      "IsParentOfDefLineScope",
      [](nb::handle maybe_parent, nb::handle def_line_scope) {
        const size_t parent_length = LengthOfStr(maybe_parent);
        return IsParentOfDefLineScope(parent_length, LengthOfStr(def_line_scope));
      },
      nb::arg("maybe_parent").none(), nb::arg("def_line_scope").none(),
      "Whether a scope is the parent of a def line's scope, where one is known to contain the other: only\n"
      "lengths are compared.");
  m.def(
      "IsTopLevelModuleScope", [](nb::handle scope) { return LengthOfStr(scope) == 0; }, nb::arg("scope").none(),
      "Whether a scope is the module's own.");
  nb::class_<CKindFilter>(m, "CKindFilter", "A set of kinds, asked in one step.")
      .def(
          "__init__",
          [](CKindFilter* self, nb::handle kinds) {
            CKindFilter filter;
            SetFlags(filter, kinds);
            new (self) CKindFilter(filter);
          },
          nb::arg("kinds") = nb::tuple(), "Matches the given kinds.")
      .def(
          "KindMatches", [](const CKindFilter& self, nb::handle kind) { return self.KindMatches(ByteOf(kind)); },
          nb::arg("kind"), "Whether a kind is in the set.");
}

}  // namespace

void BindSymbolinfo(nb::module_& tarvex) {
  nb::module_ m = SiblingModule(tarvex, "symbolinfo");
  BindConstants(m);
  BindComposing(m);
  BindBuilder(m);
  BindReading(m);
}

}  // namespace quillet::host
