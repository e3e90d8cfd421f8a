// The sibling module _fastaccess: token types, non-nested scanning, the tokenizer over a string, the
// clock and the bits of floats.
#include <optional>
#include <string>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/interpreter_lock.h"
#include "bindings/utf8_arg.h"
#include "tokens/bits.h"
#include "tokens/clock.h"
#include "tokens/nonnested.h"
#include "tokens/string_tokenizer.h"
#include "tokens/token.h"

namespace quillet::host {
namespace {

// ---- non-nested scanning ----

// A search and what keeps its pointers alive.
struct SearchRecord {
  tNonNestedStruct search;
  HostText text = EmptyText();
  HostText find = EmptyText();

  static HostText EmptyText() { return HostText::FromBytes(nb::bytes("")); }
};

// The pattern must be bytes, and the error says so in the words of an argument that has a type.
HostText PatternOf(nb::handle to_find_bytes) {
  if (PyBytes_Check(to_find_bytes.ptr())) return HostText::FromBytes(to_find_bytes);
  PyErr_Format(PyExc_TypeError, "expected bytes, %.200s found", Py_TYPE(to_find_bytes.ptr())->tp_name);
  throw nb::python_error();
}

// Leaves the record as it was where an argument is refused.
void InitRecord(SearchRecord& record, nb::handle to_search, nb::handle to_find_bytes, nb::handle start,
                nb::handle end) {
  SearchRecord fresh;
  fresh.text = HostText::FromStrOrBytes(to_search);
  fresh.find = PatternOf(to_find_bytes);
  InitNonNestedStruct(fresh.search, fresh.text.text(), fresh.find.text(), Int64Of(start), Int64Of(end));
  record = std::move(fresh);
}

// A search over objects of the host's, which it lets go of as soon as there is nothing more to find.
class NonNestedSearch {
 public:
  int InitWith(nb::handle to_search, nb::handle to_find_bytes, nb::handle start, nb::handle end) {
    SearchRecord fresh;
    InitRecord(fresh, to_search, to_find_bytes, start, end);
    record_ = std::move(fresh);
    return 0;
  }
  int64_t FindNext() {
    if (!record_) return -1;
    const int64_t found = FindNextNonNestedStruct(record_->search);
    if (found < 0) Clear();
    return found;
  }
  void Clear() { record_.reset(); }

 private:
  std::optional<SearchRecord> record_;
};

void BindScanning(nb::module_& m) {
  nb::class_<SearchRecord>(m, "tNonNestedStruct",
                           "A search for bytes outside brackets and strings; see InitNonNestedStruct. Fresh, it finds "
                           "nothing.")
      .def(nb::init<>())
      .def_prop_ro("text", [](const SearchRecord& self) { return BytesOf(self.text.text()); })
      .def_prop_ro("find", [](const SearchRecord& self) { return BytesOf(self.find.text()); })
      .def_prop_ro("find_len", [](const SearchRecord& self) { return self.search.find_len; })
      .def_prop_ro("first_byte",
                   [](const SearchRecord& self) { return static_cast<unsigned char>(self.search.first_byte); })
      .def_prop_ro("pos", [](const SearchRecord& self) { return self.search.pos; })
      .def_prop_ro("end", [](const SearchRecord& self) { return self.search.end; })
      .def_prop_ro("depth", [](const SearchRecord& self) { return self.search.depth; });

  m.def("InitNonNestedStruct", &InitRecord, nb::arg("struct"), nb::arg("to_search").none(),
        nb::arg("to_find_bytes").none(), nb::arg("start"), nb::arg("end"),
        "Begins a search for bytes in the UTF-8 of a str or bytes, from offset `start` up to `end`.\n\nBoth must lie "
        "within the text up to its first NUL (AssertionError). Empty bytes are found nowhere.");
  m.def(
      "FindNextNonNestedStruct", [](SearchRecord& record) { return FindNextNonNestedStruct(record.search); },
      nb::arg("struct"), "The offset of the next match outside brackets and strings, -1 if there is none.");
  m.def(
      "_FindStringEndNonNested",
      [](const SearchRecord& record, nb::handle pos) {
        return FindStringEndNonNested(record.search.text, Int64Of(pos), record.search.end);
      },
      nb::arg("struct"), nb::arg("pos"),
      "The offset behind the string literal whose quote stands at `pos`; the search's end for one that is not\n"
      "closed within it. ValueError where no quote stands.");
  m.def(
      "NextNonNestedUtf8PtrIndex",
      [](nb::handle utf8, nb::handle pos, nb::handle end_pos) {
        const int64_t at = PositionOf(pos);
        const Utf8Arg text(utf8);
        return NextNonNestedUtf8PtrIndex(text.ptr(), at, text.End(end_pos));
      },
      nb::arg("utf8_ptr").none(), nb::arg("pos"), nb::arg("end_pos"),
      "The offset behind the byte, bracketed group or string that starts at `pos`; -1 at or past `end_pos`.");
  m.def(
      "_NonInlineNextNonNestedUtf8PtrIndex",
      [](nb::handle utf8, nb::handle pos, nb::handle end_pos) {
        const int64_t at = PositionOf(pos);
        const Utf8Arg text(utf8);
        const int64_t end = text.End(end_pos);
        return at < end ? NonInlineNextNonNestedUtf8PtrIndex(text.ptr(), at, end) : -1;
      },
      nb::arg("utf8_ptr").none(), nb::arg("pos"), nb::arg("end_pos"),
      "The same; NextNonNestedUtf8PtrIndex calls it for groups and strings.");

  nb::class_<NonNestedSearch>(m, "CNonNestedSearch",
                              "A search for bytes outside brackets and strings that keeps what it searches alive.")
      .def(nb::init<>())
      .def("InitWith", &NonNestedSearch::InitWith, nb::arg("to_search").none(), nb::arg("to_find_bytes").none(),
           nb::arg("start"), nb::arg("end"), "Begins a search as InitNonNestedStruct does. Returns 0.")
      .def("FindNext", &NonNestedSearch::FindNext,
           "The offset of the next match, or -1, which also lets go of the text and the bytes searched for.")
      .def("Clear", &NonNestedSearch::Clear, "Lets go of both; FindNext then gives -1.");
}

// ---- tokens ----

void BindTokens(nb::module_& m) {
  m.def(
      "GetTokenType", [](nb::handle tok) { return GetTokenType(HostText::FromStrOrBytes(tok).text()); },
      nb::arg("tok").none(), "The token type id of a token's text, a str or bytes; kTokenId_ERRORTOKEN for no token.");
  // In the order of the table: of two names of a number, the later one is its name.
#define QUILLET_TOKEN(name, number, text) m.attr("kTokenId_" #name) = int{number};
#include "tokens/token_ids.def"

  nb::class_<CStringTokenizer>(m, "CStringTokenizer", "The tokens of a text one by one.")
      .def(
          "__init__",
          [](CStringTokenizer* self, nb::handle utf8_bytes) {
            new (self) CStringTokenizer(HostText::FromStrOrBytes(utf8_bytes).text());
          },
          nb::arg("utf8_bytes").none(), "Stands at the first token of UTF-8 bytes (or of a str).")
      .def(
          "GetToken", [](const CStringTokenizer& self) { return StrOf(self.Current()); },
          "The current token as str; None at the end.")
      .def(
          "GetTokenType", [](const CStringTokenizer& self) { return TypeOfCode(self.CurrentCode()); },
          "Its token type id; kTokenId_ENDMARKER at the end.")
      .def("Advance", &CStringTokenizer::Advance, "Moves to the next token; at the end, nothing happens.")
      .def("IsAtEnd", &CStringTokenizer::AtEnd, "Whether no token remains.")
      .def("GetUtf8Offset", &CStringTokenizer::Offset, "The current token's offset in bytes; the length at the end.")
      .def("GetBracketDepth", &CStringTokenizer::BracketDepth,
           "How many brackets, of all three kinds, are open in front of the current token.");
}

// ---- clock ----

constexpr const char* kClockModule = "quillet._fastaccess";
constexpr const char* kClockName = "__TimeFunc";

// The host's clock is looked up at each call, since a test may put another in its place.
double HostSeconds() {
  const Locked lock;
  const nb::object seconds = nb::module_::import_(kClockModule).attr(kClockName)();
  const double value = PyFloat_AsDouble(seconds.ptr());
  if (value == -1.0 && PyErr_Occurred()) throw nb::python_error();
  return value;
}

double DoubleOf(nb::handle number) {
  const double value = PyFloat_AsDouble(number.ptr());
  if (value == -1.0 && PyErr_Occurred()) throw nb::python_error();
  return value;
}

void BindClock(nb::module_& m) {
  SetTimeFunc(HostSeconds);
  m.def("GetNowTime", &GetNowTime, "Seconds by the clock in use, the callable `__TimeFunc` of this module.");
  m.def(
      "OutOfTime", [](nb::handle end_time) { return OutOfTime(DoubleOf(end_time)); }, nb::arg("end_time"),
      "Whether the time is `end_time` or later.");
}

// ---- bits and bytes ----

double DoubleOfBits(nb::handle l) {
  nb::object number = nb::steal(PyNumber_Index(l.ptr()));
  if (!number.is_valid()) throw nb::python_error();
  const unsigned long long bits = PyLong_AsUnsignedLongLong(number.ptr());
  if (bits == static_cast<unsigned long long>(-1) && PyErr_Occurred()) throw nb::python_error();
  return DoubleValueForULongLongBits(bits);
}

double DoubleOfLowBits(nb::handle l) {
  const unsigned long long bits = PyLong_AsUnsignedLongLongMask(l.ptr());
  if (bits == static_cast<unsigned long long>(-1) && PyErr_Occurred()) throw nb::python_error();
  return DoubleValueForULongLongBits(bits);
}

bool IsBytesInBytes(nb::handle sub, nb::handle whole) {
  if (!PyBytes_Check(sub.ptr()) || !PyBytes_Check(whole.ptr()))
    ThrowError(ErrorKind::kTypeError, "Both sub and whole must be strings");
  return StrInStr(HostText::FromBytes(sub).text(), HostText::FromBytes(whole).text());
}

void BindBits(nb::module_& m) {
  m.def(
      "ULongLongValueForDoubleBits", [](nb::handle f) { return ULongLongValueForDoubleBits(DoubleOf(f)); },
      nb::arg("f"), "The 64 bits of a float as an int from 0 on.");
  m.def("DoubleValueForULongLongBits", &DoubleOfBits, nb::arg("l"),
        "The float whose 64 bits are `l`. OverflowError for a negative int, and for one past 64 bits.");
  m.def("DoubleValueForPyIntBits", &DoubleOfLowBits, nb::arg("l"),
        "The float whose 64 bits are the low 64 of an int of any size.");
  m.def(
      "LocationsEqual", [](nb::handle loc1, nb::handle loc2) { return loc1.is(loc2); }, nb::arg("loc1").none(),
      nb::arg("loc2").none(), "Whether the two are the same object.");
  m.def("StrInStr", &IsBytesInBytes, nb::arg("sub").none(), nb::arg("whole").none(),
        "Whether the bytes `sub` occur in the bytes `whole`, each up to its first NUL.");
  m.def(
      "IsDigit", [](nb::handle c) { return IsDigit(Int64Of(c)); }, nb::arg("c"),
      "Whether a byte, given as int, is an ASCII digit.");
  m.def(
      "IsAlnum", [](nb::handle c) { return IsAlnum(Int64Of(c)); }, nb::arg("c"),
      "Whether a byte, given as int, is an ASCII letter or digit.");
}

}  // namespace

void BindFastaccess(nb::module_& tarvex) {
  nb::module_ m = SiblingModule(tarvex, "_fastaccess");
  BindTokens(m);
  BindScanning(m);
  BindClock(m);
  BindBits(m);
}

}  // namespace quillet::host
