// The sibling module strutils: UTF-8 text primitives.
//
// Positions are offsets in UTF-8 bytes, whatever type the text has. An end past the text is its end.
#include <algorithm>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/utf8_arg.h"
#include "foundations/strutils.h"
#include "foundations/utf8.h"

namespace quillet::host {
namespace {

using Classifier = bool (*)(const char*, int64_t, int64_t);

template <Classifier kIsClass>
bool IsClassAt(nb::handle utf8, nb::handle pos, nb::handle end_pos) {
  const int64_t at = PositionOf(pos);
  const Utf8Arg text(utf8);
  return kIsClass(text.ptr(), at, text.End(end_pos));
}

uint32_t MultiByteCharAt(nb::handle utf8, nb::handle pos, nb::handle end_pos) {
  const int64_t at = PositionOf(pos);
  const Utf8Arg text(utf8);
  const int64_t end = text.End(end_pos);
  if (at >= end) ThrowError(ErrorKind::kIndexError, "position at or behind the end");
  return NonInlineUcs4CharAtUtf8Pos(text.ptr(), at, end);
}

nb::object Concat(nb::handle s0, nb::handle s1, nb::handle s2, nb::handle s3, nb::handle s4) {
  const HostText t0 = HostText::FromStrOrBytes(s0, true);
  const HostText t1 = HostText::FromStrOrBytes(s1, true);
  const HostText t2 = HostText::FromStrOrBytes(s2, true);
  const HostText t3 = HostText::FromStrOrBytes(s3, true);
  const HostText t4 = HostText::FromStrOrBytes(s4, true);
  return BytesOf(Utf8Concat5(t0.text(), t1.text(), t2.text(), t3.text(), t4.text()));
}

Py_UCS4 CharCodeAt(nb::handle s, nb::handle i) {
  if (!PyUnicode_Check(s.ptr())) ThrowExpected("str", s);
  const Py_ssize_t length = PyUnicode_GET_LENGTH(s.ptr());
  Py_ssize_t index = Int64Of(i);
  if (index < 0) index += length;
  if (index < 0 || index >= length) ThrowError(ErrorKind::kIndexError, "string index out of range");
  return PyUnicode_READ_CHAR(s.ptr(), index);
}

// Digits of an integer of any size.
nb::object DigitsOf(nb::handle n) {
  nb::object number = nb::steal(PyNumber_Index(n.ptr()));
  if (!number.is_valid()) throw nb::python_error();
  int overflow;
  const long long value = PyLong_AsLongLongAndOverflow(number.ptr(), &overflow);
  if (overflow == 0) return BytesOf(BytesForInteger(value));
  nb::object digits = nb::steal(PyNumber_ToBase(number.ptr(), 10));
  if (!digits.is_valid()) throw nb::python_error();
  return BytesOf(HostText::FromStr(digits).text());
}

void BindPositions(nb::module_& m) {
  m.def(
      "GetUtf8Ptr", [](nb::handle text) { return BytesOf(Utf8Arg(text).bytes()); }, nb::arg("text").none(),
      "The UTF-8 bytes of a str, bytes or bytearray. TypeError for any other type.");
  m.def(
      "AdjustUtf8Pos",
      [](nb::handle utf8, nb::handle pos, nb::handle diff, nb::handle end_pos) {
        int64_t at = Int64Of(pos);
        const int64_t steps = Int64Of(diff);
        const Utf8Arg text(utf8);
        // A position behind the text stays as it is going forward; there is nothing to count there going
        // backward.
        if (steps < 0) at = std::min(at, text.size());
        return AdjustUtf8Pos(text.ptr(), at, steps, text.End(end_pos));
      },
      nb::arg("utf8_ptr").none(), nb::arg("pos"), nb::arg("diff"), nb::arg("end_pos"),
      "`pos` (in bytes) moved by `diff` characters.\n\nA position inside a character first moves back to that "
      "character's start. Forward, it stops at\n`end_pos`; backward past the start, the result is negative.");
  m.def(
      "Ucs4CharAtUtf8Pos",
      [](nb::handle utf8, nb::handle pos, nb::handle end_pos) {
        const int64_t at = PositionOf(pos);
        const Utf8Arg text(utf8);
        return Ucs4CharAtUtf8Pos(text.ptr(), at, text.End(end_pos));
      },
      nb::arg("utf8_ptr").none(), nb::arg("pos"), nb::arg("end_pos"),
      "The code point at `pos`, 0 at or past `end_pos`. ValueError for malformed UTF-8, IndexError for a\n"
      "negative `pos`.");
  m.def("_NonInlineUcs4CharAtUtf8Pos", &MultiByteCharAt, nb::arg("utf8_ptr").none(), nb::arg("pos"), nb::arg("end_pos"),
        "The code point at `pos`, which must lie in the text (IndexError). ValueError for malformed UTF-8.");
  m.def("IsSpaceAtUtf8Pos", &IsClassAt<IsSpaceAtUtf8Pos>, nb::arg("utf8_ptr").none(), nb::arg("pos"),
        nb::arg("end_pos"), "Whether white space stands at `pos`; False at or past `end_pos`.");
  m.def("IsDigitAtUtf8Pos", &IsClassAt<IsDigitAtUtf8Pos>, nb::arg("utf8_ptr").none(), nb::arg("pos"),
        nb::arg("end_pos"), "Whether a digit stands at `pos`; False at or past `end_pos`.");
  m.def("IsAlnumAtUtf8Pos", &IsClassAt<IsAlnumAtUtf8Pos>, nb::arg("utf8_ptr").none(), nb::arg("pos"),
        nb::arg("end_pos"),
        "Whether a letter, digit or numeric character stands at `pos`; False at or past `end_pos`.");
  m.def(
      "IsIdentifierCharAtUtf8Pos",
      [](nb::handle utf8, nb::handle pos, nb::handle end_pos, Truth initial) {
        const int64_t at = PositionOf(pos);
        const Utf8Arg text(utf8);
        return IsIdentifierCharAtUtf8Pos(text.ptr(), at, text.End(end_pos), initial);
      },
      nb::arg("utf8_ptr").none(), nb::arg("pos"), nb::arg("end_pos"), nb::arg("initial"),
      "Whether the character at `pos` may begin an identifier (`initial`) or stand in one; False at or past\n"
      "`end_pos`.");
}

void BindSearches(nb::module_& m) {
  m.def(
      "PtrFindByte",
      [](nb::handle ptr, nb::handle length, nb::handle c, nb::handle start) {
        const int64_t size = Int64Of(length);
        const char byte = ByteOf(c);
        const int64_t from = Int64Of(start);
        const Utf8Arg text(ptr);
        if (size > text.size()) ThrowError(ErrorKind::kValueError, "Invalid length");
        return PtrFindByte(text.ptr(), size, byte, from);
      },
      nb::arg("ptr").none(), nb::arg("length"), nb::arg("c"), nb::arg("start"),
      "The offset of the byte `c` in the first `length` bytes, from `start` on; -1 if absent.\n\n"
      "ValueError \"Invalid start\" unless 0 <= start < length.");
  m.def(
      "BytesFindByte",
      [](nb::handle b, nb::handle c, nb::handle start) {
        const HostText bytes = HostText::FromBytes(b);
        return PtrFindByte(bytes.text().data(), static_cast<int64_t>(bytes.text().size()), ByteOf(c), Int64Of(start));
      },
      nb::arg("b").none(), nb::arg("c"), nb::arg("start") = 0,
      "The offset of the byte `c` in a bytes object, from `start` on; -1 if absent.\n\n"
      "ValueError \"Invalid start\" unless 0 <= start < len(b).");
  m.def("OrdAt", &CharCodeAt, nb::arg("s").none(), nb::arg("i"),
        "The code of character `i` of a str, from the end for a negative `i`. IndexError out of range.");
  m.def(
      "IsUtf8LeadByte", [](nb::handle b) { return IsUtf8LeadByte(ByteOf(b)); }, nb::arg("b"),
      "Whether a byte begins a character: anything but 10xxxxxx.");
}

void BindConversions(nb::module_& m) {
  m.def("Utf8Concat5", &Concat, nb::arg("s0").none(), nb::arg("s1").none(), nb::arg("s2") = nb::none(),
        nb::arg("s3") = nb::none(), nb::arg("s4") = nb::none(),
        "One bytes object of up to five pieces, str (as UTF-8) or bytes; None is left out.");
  m.def(
      "Utf8Concat2", [](nb::handle s0, nb::handle s1) { return Concat(s0, s1, Py_None, Py_None, Py_None); },
      nb::arg("s0").none(), nb::arg("s1").none(), "Utf8Concat5 of two pieces.");
  m.def(
      "Utf8Concat3", [](nb::handle s0, nb::handle s1, nb::handle s2) { return Concat(s0, s1, s2, Py_None, Py_None); },
      nb::arg("s0").none(), nb::arg("s1").none(), nb::arg("s2").none(), "Utf8Concat5 of three pieces.");
  m.def(
      "Utf8Concat4",
      [](nb::handle s0, nb::handle s1, nb::handle s2, nb::handle s3) { return Concat(s0, s1, s2, s3, Py_None); },
      nb::arg("s0").none(), nb::arg("s1").none(), nb::arg("s2").none(), nb::arg("s3").none(),
      "Utf8Concat5 of four pieces.");
  m.def(
      "Utf8Len", [](nb::handle s) { return Utf8Len(HostText::FromStrOrBytes(s).text()); }, nb::arg("s").none(),
      "The length of a str or bytes in UTF-8 bytes.");
  m.def(
      "AsUtf8",
      [](nb::handle s) {
        if (PyBytes_Check(s.ptr())) return nb::borrow(s);
        return BytesOf(HostText::FromStr(s).text());
      },
      nb::arg("s").none(), "bytes for a str, as UTF-8; bytes are returned as they are.");
  m.def(
      "AsStr",
      [](nb::handle s) {
        if (PyUnicode_Check(s.ptr()) || s.is_none()) return nb::borrow(s);
        return StrOf(HostText::FromStrOrBytes(s).text());
      },
      nb::arg("s").none(),
      "A str for bytes of UTF-8; a str, and None, are returned as they are.\n\nBytes that are no UTF-8 become lone "
      "surrogates, as with the \"surrogateescape\" handler, and AsUtf8\ngives them back.");
  m.def("BytesForInteger", &DigitsOf, nb::arg("n"), "The decimal digits of an integer of any size, as bytes.");
}

void BindTextPosInfo(nb::module_& m) {
  nb::class_<TextPosInfo>(m, "TextPosInfo",
                          "A place inside a text that may span lines: the line, and the column in that line in "
                          "characters and in\nUTF-8 bytes, all from 0; -1 for a column that is not known.")
      .def(nb::init<int64_t, int64_t, int64_t>(), nb::arg("lineno") = 0, nb::arg("char_col") = -1,
           nb::arg("utf8_col") = -1)
      .def_rw("lineno", &TextPosInfo::lineno)
      .def_rw("char_col", &TextPosInfo::char_col)
      .def_rw("utf8_col", &TextPosInfo::utf8_col)
      .def(
          "__eq__", [](const TextPosInfo& self, const TextPosInfo& other) { return self == other; }, nb::is_operator())
      .def("__repr__", [](const TextPosInfo& self) {
        return nb::str("TextPosInfo(lineno={}, char_col={}, utf8_col={})")
            .format(self.lineno, self.char_col, self.utf8_col);
      });
}

}  // namespace

void BindStrutils(nb::module_& tarvex) {
  nb::module_ m = SiblingModule(tarvex, "strutils");
  BindPositions(m);
  BindSearches(m);
  BindConversions(m);
  BindTextPosInfo(m);
}

}  // namespace quillet::host
