// See convert.h.
#include "bindings/convert.h"

#include <algorithm>
#include <array>
#include <limits>
#include <optional>
#include <unordered_map>

#include "bindings/host_call.h"
#include "bindings/line_object.h"

namespace quillet::host {
namespace {

// Objects that hosts gave to nodes as their context, by number.
struct ForeignContexts {
  std::unordered_map<int32_t, nb::object> objects;
  int32_t next = 1;
};

ForeignContexts& Foreign() {
  static auto* table = new ForeignContexts;  // outlives the interpreter's last objects
  return *table;
}

void ReleaseForeign(int32_t number) {
  // Nodes are given back with the interpreter lock held or not at all (a batch without it never
  // meets a node that a host touched), so the table needs no lock of its own.
  auto gone = Foreign().objects.extract(number);
  if (gone) LetGo(std::move(gone.mapped()));
}

nb::object DecodeLossless(Text text) {
  PyObject* object = PyUnicode_DecodeUTF8(text.data(), static_cast<Py_ssize_t>(text.size()), "surrogateescape");
  if (object == nullptr) throw nb::python_error();
  return nb::steal(object);
}

// Shared str objects of the words and operators, by token code.
PyObject* SharedTokenStr(const Token& token) {
  static std::array<PyObject*, 256> table{};
  if (token.code < tok::LPAR || token.code >= tok::COMMENT) return nullptr;
  if (token.code == tok::NEWLINE || token.code == tok::ERRORTOKEN || token.code == tok::NOTEQUAL ||
      token.code == tok::RARROW)
    return nullptr;  // codes that stand for more than one text
  if (!IsWordCode(token.code) && token.code > tok::COLONEQUAL) return nullptr;
  PyObject*& entry = table[token.code];
  if (entry == nullptr) {
    entry = DecodeLossless(token.view()).release().ptr();
    PyUnicode_InternInPlace(&entry);
  }
  return entry;
}

}  // namespace

nb::object StrOf(Text text) {
  if (IsNone(text)) return nb::none();
  return DecodeLossless(text);
}

nb::object StrOfToken(const Token& token) {
  if (token.removed()) return nb::none();
  if (PyObject* shared = SharedTokenStr(token)) return nb::borrow(shared);
  return DecodeLossless(token.view());
}

nb::object BytesOf(Text text) {
  if (IsNone(text)) return nb::none();
  PyObject* object = PyBytes_FromStringAndSize(text.data(), static_cast<Py_ssize_t>(text.size()));
  if (object == nullptr) throw nb::python_error();
  return nb::steal(object);
}

HostText HostText::FromStr(nb::handle object, bool none) {
  HostText result;
  if (none && object.is_none()) return result;
  if (!PyUnicode_Check(object.ptr())) ThrowExpected("str", object);
  Py_ssize_t size;
  if (const char* utf8 = PyUnicode_AsUTF8AndSize(object.ptr(), &size)) {
    result.keep_ = nb::borrow(object);
    result.text_ = {utf8, static_cast<size_t>(size)};
    return result;
  }
  PyErr_Clear();
  PyObject* bytes = PyUnicode_AsEncodedString(object.ptr(), "utf-8", "surrogateescape");
  if (bytes == nullptr) {
    PyErr_Clear();
    bytes = PyUnicode_AsEncodedString(object.ptr(), "utf-8", "surrogatepass");
  }
  if (bytes == nullptr) throw nb::python_error();
  result.keep_ = nb::steal(bytes);
  result.text_ = {PyBytes_AS_STRING(bytes), static_cast<size_t>(PyBytes_GET_SIZE(bytes))};
  return result;
}

HostText HostText::FromBytes(nb::handle object) {
  if (!PyBytes_Check(object.ptr())) ThrowExpected("bytes", object);
  HostText result;
  result.keep_ = nb::borrow(object);
  result.text_ = {PyBytes_AS_STRING(object.ptr()), static_cast<size_t>(PyBytes_GET_SIZE(object.ptr()))};
  return result;
}

HostText HostText::FromStrOrBytes(nb::handle object, bool none) {
  return PyBytes_Check(object.ptr()) ? FromBytes(object) : FromStr(object, none);
}

int64_t Int64Of(nb::handle object) {
  if (!PyIndex_Check(object.ptr())) {
    PyErr_SetString(PyExc_TypeError, "an integer is required");
    throw nb::python_error();
  }
  const Py_ssize_t value = PyNumber_AsSsize_t(object.ptr(), PyExc_OverflowError);
  if (value == -1 && PyErr_Occurred()) throw nb::python_error();
  return value;
}

int32_t Int32Of(nb::handle object) {
  if (!PyIndex_Check(object.ptr())) {
    PyErr_SetString(PyExc_TypeError, "an integer is required");
    throw nb::python_error();
  }
  const Py_ssize_t value = PyNumber_AsSsize_t(object.ptr(), nullptr);  // clips what does not fit
  if (value == -1 && PyErr_Occurred()) throw nb::python_error();
  if (value < std::numeric_limits<int32_t>::min() || value > std::numeric_limits<int32_t>::max()) {
    PyErr_SetString(PyExc_OverflowError, "value too large to convert to int");
    throw nb::python_error();
  }
  return static_cast<int32_t>(value);
}

namespace {

std::optional<nb::python_error>& TruthFailure() {
  static auto* failure = new std::optional<nb::python_error>;  // outlives the interpreter's last objects
  return *failure;
}

}  // namespace

void KeepTruthFailure() { TruthFailure().emplace(); }

void ThrowTruthFailure() {
  nb::python_error failure = std::move(*TruthFailure());
  TruthFailure().reset();
  throw nb::python_error(std::move(failure));
}

Version VersionOf(nb::handle object) {
  if (!PyTuple_Check(object.ptr())) ThrowExpected("tuple", object);
  Version version{{0, 0, 0}, 0};
  const Py_ssize_t size = PyTuple_GET_SIZE(object.ptr());
  // The third part is never looked at: what a version has is told by the first two.
  for (Py_ssize_t i = 0; i < size && i < 3; ++i)
    version.parts[version.count++] = i < 2 ? Int32Of(PyTuple_GET_ITEM(object.ptr(), i)) : 0;
  return version;
}

nb::object TupleOf(nb::handle object) {
  if (PyTuple_CheckExact(object.ptr())) return nb::borrow(object);
  PyObject* tuple = PySequence_Tuple(object.ptr());
  if (tuple == nullptr) throw nb::python_error();
  return nb::steal(tuple);
}

Ref<SourceText> SourceOfTokens(nb::handle tuple) {
  const Py_ssize_t count = PyTuple_GET_SIZE(tuple.ptr());
  std::vector<HostText> texts(static_cast<size_t>(count));
  size_t size = 0;
  for (Py_ssize_t i = 0; i < count; ++i) {
    texts[i] = HostText::FromStr(PyTuple_GET_ITEM(tuple.ptr(), i), true);
    size += texts[i].text().size() + 1;
  }
  // The tokens stand one blank apart, so that no two of them read as one.
  std::string bytes;
  bytes.reserve(size);
  for (const HostText& text : texts) {
    bytes += text.text();
    bytes += ' ';
  }
  Ref<SourceText> source = SourceText::Copy(bytes);
  source->tokens.reserve(texts.size());
  const char* at = source->begin();
  for (const HostText& host_text : texts) {
    const Text text = host_text.text();
    if (IsNone(text)) {
      source->tokens.push_back({});
    } else {
      const Text stored(at, text.size());
      source->tokens.push_back({at, static_cast<uint32_t>(text.size()), CodeOfText(stored)});
    }
    at += text.size() + 1;
  }
  return source;
}

std::vector<Position> PositionsOf(nb::handle tuple) {
  const Py_ssize_t count = PyTuple_GET_SIZE(tuple.ptr());
  std::vector<Position> positions;
  positions.reserve(static_cast<size_t>(count));
  for (Py_ssize_t i = 0; i < count; ++i) {
    nb::object pair = TupleOf(PyTuple_GET_ITEM(tuple.ptr(), i));
    const Py_ssize_t size = PyTuple_GET_SIZE(pair.ptr());
    if (size != 2) {
      if (size > 2) {
        PyErr_Format(PyExc_ValueError, "too many values to unpack (expected %zd)", Py_ssize_t{2});
      } else {
        PyErr_Format(PyExc_ValueError, "need more than %zd value%.1s to unpack", size, size == 1 ? "" : "s");
      }
      throw nb::python_error();
    }
    positions.push_back({Int32Of(PyTuple_GET_ITEM(pair.ptr(), 0)), Int32Of(PyTuple_GET_ITEM(pair.ptr(), 1))});
  }
  return positions;
}

nb::object HostContext(Context context) {
  if (context.IsNone()) return nb::none();
  if (context.IsIndex()) return nb::int_(context.value);
  if (context.IsForeign()) {
    auto found = Foreign().objects.find(context.value);
    return found == Foreign().objects.end() ? nb::none() : found->second;
  }
  return nb::make_tuple(context.value, context.col);
}

Context ErrorContext(nb::handle object) {
  if (PyTuple_Check(object.ptr())) {
    auto [line, column] = UnpackPair(object);
    return Context::At({Int32Of(line), Int32Of(column)});
  }
  if (!PyIndex_Check(object.ptr())) ThrowExpected("int", object);
  const Py_ssize_t index = PyNumber_AsSsize_t(object.ptr(), nullptr);
  if (index == -1 && PyErr_Occurred()) throw nb::python_error();
  constexpr Py_ssize_t kLeast = std::numeric_limits<int32_t>::min();
  constexpr Py_ssize_t kMost = std::numeric_limits<int32_t>::max();
  return Context::Index(static_cast<int32_t>(std::clamp(index, kLeast, kMost)));
}

Context CoreContext(nb::handle object, NodePool* pool) {
  if (object.is_none()) return Context::None();
  PyObject* ptr = object.ptr();
  const auto fits = [](PyObject* value, int32_t least) {
    if (!PyLong_CheckExact(value)) return false;
    int overflow;
    const long number = PyLong_AsLongAndOverflow(value, &overflow);
    return overflow == 0 && number >= least && number <= std::numeric_limits<int32_t>::max();
  };
  if (fits(ptr, std::numeric_limits<int32_t>::min())) return Context::Index(static_cast<int32_t>(PyLong_AsLong(ptr)));
  if (PyTuple_CheckExact(ptr) && PyTuple_GET_SIZE(ptr) == 2) {
    PyObject* line = PyTuple_GET_ITEM(ptr, 0);
    PyObject* col = PyTuple_GET_ITEM(ptr, 1);
    // A negative column would read as a tag.
    if (fits(line, std::numeric_limits<int32_t>::min()) && fits(col, 0))
      return Context::At({static_cast<int32_t>(PyLong_AsLong(line)), static_cast<int32_t>(PyLong_AsLong(col))});
  }
  if (pool == nullptr) ThrowError(ErrorKind::kTypeError, "a context is an int, a pair of ints or None here");
  pool->release_foreign = ReleaseForeign;
  ForeignContexts& foreign = Foreign();
  int32_t number = foreign.next;
  while (foreign.objects.contains(number)) number = number == std::numeric_limits<int32_t>::max() ? 1 : number + 1;
  foreign.next = number == std::numeric_limits<int32_t>::max() ? 1 : number + 1;
  foreign.objects.emplace(number, nb::borrow(object));
  return Context::Foreign(number);
}

}  // namespace quillet::host
