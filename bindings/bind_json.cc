// JSON that is plain, read and written as objects of the host: what messages of editors are made of.
//
// Plain is what has no numbers but whole ones of 64 bits, is nested no deeper than kDeepest and, where it is read,
// right. All else is the host's module json's.
#include <charconv>
#include <string>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "foundations/utf8.h"
#include "output/json_lines.h"

namespace quillet::host {

namespace {

constexpr int kDeepest = 200;

class JsonReader {
 public:
  explicit JsonReader(Text text) : at_(text.data()), end_(text.data() + text.size()) {}

  nb::object Read() {
    nb::object value = Value(0);
    SkipSpace();
    if (at_ != end_) Refuse();
    return value;
  }

 private:
  [[noreturn]] static void Refuse() { throw nb::value_error("no plain JSON"); }

  void SkipSpace() {
    while (at_ != end_ && (*at_ == ' ' || *at_ == '\n' || *at_ == '\r' || *at_ == '\t')) ++at_;
  }
  bool Takes(char c) {
    if (at_ == end_ || *at_ != c) return false;
    ++at_;
    return true;
  }
  char Taken() {
    if (at_ == end_) Refuse();
    return *at_++;
  }

  nb::object Value(int depth) {
    if (depth > kDeepest) Refuse();
    SkipSpace();
    switch (Taken()) {
      case '{':
        return Object(depth);
      case '[':
        return Array(depth);
      case '"':
        return String();
      case 't':
        return Word("rue", nb::bool_(true));
      case 'f':
        return Word("alse", nb::bool_(false));
      case 'n':
        return Word("ull", nb::none());
      default:
        --at_;
        return Number();
    }
  }

  nb::object Object(int depth) {
    nb::dict object;
    SkipSpace();
    if (Takes('}')) return object;
    do {
      SkipSpace();
      if (!Takes('"')) Refuse();
      const nb::object key = String();
      SkipSpace();
      if (!Takes(':')) Refuse();
      object[key] = Value(depth + 1);
      SkipSpace();
    } while (Takes(','));
    if (!Takes('}')) Refuse();
    return object;
  }

  nb::object Array(int depth) {
    nb::list array;
    SkipSpace();
    if (Takes(']')) return array;
    do {
      array.append(Value(depth + 1));
      SkipSpace();
    } while (Takes(','));
    if (!Takes(']')) Refuse();
    return array;
  }

  nb::object Word(Text rest, nb::object value) {
    if (static_cast<size_t>(end_ - at_) < rest.size() || Text(at_, rest.size()) != rest) Refuse();
    at_ += rest.size();
    return value;
  }

  nb::object Number() {
    long long number = 0;
    const char* const digits = at_ != end_ && *at_ == '-' ? at_ + 1 : at_;
    const auto [behind, error] = std::from_chars(at_, end_, number);
    const bool has_zeros = behind - digits > 1 && *digits == '0';
    const bool goes_on = behind != end_ && (*behind == '.' || *behind == 'e' || *behind == 'E');
    if (error != std::errc() || has_zeros || goes_on) Refuse();
    at_ = behind;
    return nb::int_(number);
  }

  // Behind the quote.
  nb::object String() {
    const char* begin = at_;
    SkipLetters();
    if (at_ == end_) Refuse();
    if (*at_ == '"') return Decoded(Text(begin, at_++ - begin));
    std::string text;
    while (true) {
      text.append(begin, at_);
      if (Takes('"')) return Decoded(text);
      if (!Takes('\\')) Refuse();
      AppendEscaped(text);
      begin = at_;
      SkipLetters();
    }
  }

  void SkipLetters() {
    while (at_ != end_ && *at_ != '"' && *at_ != '\\' && static_cast<uint8_t>(*at_) >= 0x20) ++at_;
  }

  void AppendEscaped(std::string& text) {
    switch (const char c = Taken()) {
      case 'n':
        text += '\n';
        return;
      case 'r':
        text += '\r';
        return;
      case 't':
        text += '\t';
        return;
      case 'b':
        text += '\b';
        return;
      case 'f':
        text += '\f';
        return;
      case '"':
      case '\\':
      case '/':
        text += c;
        return;
      case 'u': {
        uint32_t unit = Unit();
        if (unit >= 0xD800 && unit < 0xDC00 && end_ - at_ >= 6 && at_[0] == '\\' && at_[1] == 'u') {
          const char* const behind_first = at_;
          at_ += 2;
          const uint32_t second = Unit();
          if (second >= 0xDC00 && second < 0xE000)
            unit = 0x10000 + ((unit - 0xD800) << 10) + (second - 0xDC00);
          else
            at_ = behind_first;
        }
        AppendUtf8(unit, text);
        return;
      }
      default:
        Refuse();
    }
  }

  uint32_t Unit() {
    uint32_t unit = 0;
    if (end_ - at_ < 4) Refuse();
    const auto [behind, error] = std::from_chars(at_, at_ + 4, unit, 16);
    if (error != std::errc() || behind != at_ + 4) Refuse();
    at_ = behind;
    return unit;
  }

  static nb::object Decoded(Text text) {
    // Lone surrogates are let through, as json lets them.
    nb::object made =
        nb::steal(PyUnicode_DecodeUTF8(text.data(), static_cast<Py_ssize_t>(text.size()), "surrogatepass"));
    if (!made.is_valid()) throw nb::python_error();
    return made;
  }

  const char* at_;
  const char* const end_;
};

[[noreturn]] void RefuseToWrite() { throw nb::type_error("no plain value"); }

void AppendText(nb::handle value, std::string& out) {
  Py_ssize_t size = 0;
  const char* const text = PyUnicode_AsUTF8AndSize(value.ptr(), &size);
  if (text == nullptr) {  // it has lone surrogates
    PyErr_Clear();
    RefuseToWrite();
  }
  AppendJsonString(Text(text, static_cast<size_t>(size)), out);
}

void AppendValue(nb::handle value, int depth, std::string& out) {
  PyObject* const object = value.ptr();
  if (depth > kDeepest) RefuseToWrite();
  if (PyUnicode_Check(object)) {
    AppendText(value, out);
  } else if (object == Py_None) {
    out += "null";
  } else if (PyBool_Check(object)) {
    out += object == Py_True ? "true" : "false";
  } else if (PyLong_Check(object)) {
    int overflow = 0;
    const long long number = PyLong_AsLongLongAndOverflow(object, &overflow);
    if (overflow != 0) RefuseToWrite();
    char digits[20];
    out.append(digits, std::to_chars(digits, digits + sizeof(digits), number).ptr);
  } else if (PyDict_Check(object)) {
    char before = '{';
    for (const auto& [key, item] : nb::borrow<nb::dict>(value)) {
      if (!PyUnicode_Check(key.ptr())) RefuseToWrite();
      out += before;
      before = ',';
      AppendText(key, out);
      out += ':';
      AppendValue(item, depth + 1, out);
    }
    out += before == '{' ? "{}" : "}";
  } else if (PyList_Check(object) || PyTuple_Check(object)) {
    char before = '[';
    for (Py_ssize_t i = 0; i < PySequence_Fast_GET_SIZE(object); ++i) {
      out += before;
      before = ',';
      AppendValue(PySequence_Fast_GET_ITEM(object, i), depth + 1, out);
    }
    out += before == '[' ? "[]" : "]";
  } else {
    RefuseToWrite();
  }
}

}  // namespace

void BindJson(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  host.def(
      "ReadJson", [](nb::bytes text) { return JsonReader(Text(text.c_str(), text.size())).Read(); }, nb::arg("text"),
      "What a text says. ValueError where it is not plain.");
  host.def(
      "WriteJson",
      [](nb::handle value) {
        std::string text;
        AppendValue(value, 0, text);
        return BytesOf(text);
      },
      nb::arg("value").none(), "The text of a value, in ASCII. TypeError where it is not plain.");
}

}  // namespace quillet::host
