// CLogicalLine and the operations of the sibling module logicalline.
#include <algorithm>
#include <array>
#include <cstring>
#include <limits>
#include <memory>
#include <utility>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/line_object.h"
#include "lines/cutter.h"
#include "lines/logical_line.h"

namespace quillet::host {
namespace {

constexpr int kLineKindCount = static_cast<int>(LineKind::kOther);

// Objects that are asked for again and again; made once and kept.
struct Shared {
  std::array<PyObject*, kLineKindCount> kind_texts{};
  PyTypeObject* line_type = nullptr;
  struct Operation {
    PyObject* name = nullptr;
    PyObject* builtin = nullptr;  // the operation of CLogicalLine itself
  };
  Operation get_tok_type, append, append_arg, set_parsed, clear, get_exp_logicals;
};
Shared g;

// The operation of the instance's class where it is not that of CLogicalLine; null otherwise.
nb::object OverrideOf(PyObject* self, const Shared::Operation& operation) {
  nb::object found = nb::steal(PyObject_GetAttr((PyObject*)Py_TYPE(self), operation.name));
  if (!found.is_valid()) throw nb::python_error();
  return found.ptr() == operation.builtin ? nb::object() : found;
}

// bytes objects of record halves. Most infos are a bare prefix and most names occur many times, so
// the latest texts are kept, by a hash of their ends.
class BytesCache {
 public:
  // A new reference.
  PyObject* Get(const char* text, uint32_t length) {
    if (length > kLongest || length == 0) return BytesOf({text, length}).release().ptr();
    PyObject*& slot = slots_[SlotOf(text, length)];
    if (slot != nullptr && PyBytes_GET_SIZE(slot) == static_cast<Py_ssize_t>(length) &&
        std::memcmp(PyBytes_AS_STRING(slot), text, length) == 0) [[likely]]
      return Py_NewRef(slot);
    PyObject* made = BytesOf({text, length}).release().ptr();
    Py_XSETREF(slot, Py_NewRef(made));
    return made;
  }

 private:
  static constexpr uint32_t kLongest = 40;
  static constexpr int kSlotBits = 12;

  template <class Word>
  static uint64_t Load(const char* at) {
    Word word;
    std::memcpy(&word, at, sizeof word);
    return word;
  }
  static size_t SlotOf(const char* text, uint32_t length) {
    uint64_t ends;
    if (length >= 8) {
      ends = Load<uint64_t>(text) ^ (Load<uint64_t>(text + length - 8) * 31);
    } else if (length >= 4) {
      ends = Load<uint32_t>(text) << 32 | Load<uint32_t>(text + length - 4);
    } else {
      ends = Load<uint8_t>(text) << 16 | Load<uint8_t>(text + length / 2) << 8 | Load<uint8_t>(text + length - 1);
    }
    return static_cast<size_t>(((ends ^ length) * 0x9E3779B97F4A7C15u) >> (64 - kSlotBits));
  }

  std::array<PyObject*, size_t{1} << kSlotBits> slots_{};
};
BytesCache g_bytes;

// A new reference. The pair cannot be part of a cycle, so the collector need not look at it.
PyObject* PairOf(const Record& row) {
  PyObject* pair = PyTuple_New(2);
  if (pair == nullptr) throw nb::python_error();
  PyTuple_SET_ITEM(pair, 0, g_bytes.Get(row.name_text, row.name_length));
  PyTuple_SET_ITEM(pair, 1, g_bytes.Get(row.info_text, row.info_length));
  PyObject_GC_UnTrack(pair);
  return pair;
}

// The half of a host's pair as bytes that the core may keep a moment.
Text BytesOfHalf(nb::handle half, HostText& keep) {
  keep = HostText::FromBytes(half);
  return keep.text();
}

}  // namespace

std::pair<nb::object, nb::object> UnpackPair(nb::handle pair) {
  nb::object items = TupleOf(pair);
  const Py_ssize_t size = PyTuple_GET_SIZE(items.ptr());
  if (size > 2) {
    PyErr_Format(PyExc_ValueError, "too many values to unpack (expected %zd)", Py_ssize_t{2});
    throw nb::python_error();
  }
  if (size < 2) {
    PyErr_Format(PyExc_ValueError, "need more than %zd value%.1s to unpack", size, size == 1 ? "" : "s");
    throw nb::python_error();
  }
  return {nb::borrow(PyTuple_GET_ITEM(items.ptr(), 0)), nb::borrow(PyTuple_GET_ITEM(items.ptr(), 1))};
}

// ---- LineObject ----

void LineObject::Attach(PyObject* self) {
  self_ = self;
  is_python_subclass_ = Py_TYPE(self) != g.line_type;
  UpdateHooks();
}

void LineObject::UpdateHooks() {
  const bool seen =
      is_python_subclass_ || has_host_tok_types_ || equivs_.list.is_valid() || arg_equivs_.list.is_valid();
  line_->hooks = seen ? this : nullptr;
}

void LineObject::SetRow(const Ref<SourceText>& source, const LineRow& row, std::shared_ptr<SharedStore> shared) {
  SetFromRow(*line_, source, row);
  shared_ = std::move(shared);
}

nb::object LineObject::GetType() const {
  if (line_->kind == LineKind::kOther) return type_;
  return nb::borrow(g.kind_texts[static_cast<int>(line_->kind)]);
}

void LineObject::SetType(nb::handle text) {
  HostText host_text = HostText::FromStr(text);
  line_->kind = LineKindOfText(host_text.text());
  type_ = line_->kind == LineKind::kOther ? nb::borrow(text) : nb::object();
}

nb::object LineObject::GetToks() {
  if (!toks_.is_valid()) {
    const WithoutCollector all_at_once;
    nb::object tuple = nb::steal(PyTuple_New(static_cast<Py_ssize_t>(line_->toks.size())));
    if (!tuple.is_valid()) throw nb::python_error();
    for (size_t i = 0; i < line_->toks.size(); ++i)
      PyTuple_SET_ITEM(tuple.ptr(), i, StrOfToken(line_->toks[i]).release().ptr());
    toks_ = std::move(tuple);
  }
  return toks_;
}

void LineObject::SetToks(nb::handle sequence) {
  nb::object tuple = TupleOf(sequence);
  Ref<SourceText> source = SourceOfTokens(tuple);
  // Records may refer to the old source, and so may positions.
  if (!line_->has_stored_positions()) SetPositions(GetPositions());
  MoveToOwnStore();
  LetGo(std::exchange(line_->source, source));
  line_->toks = source->tokens;
  line_->no_embedded = false;
  if (!token_count_is_set_) line_->token_count = static_cast<int32_t>(source->tokens.size());
  toks_ = std::move(tuple);
  if (!has_host_tok_types_) tok_types_.reset();
}

nb::object LineObject::GetTokTypes() {
  if (!tok_types_.is_valid()) {
    const WithoutCollector all_at_once;
    nb::object list = nb::steal(PyList_New(static_cast<Py_ssize_t>(line_->toks.size())));
    if (!list.is_valid()) throw nb::python_error();
    for (size_t i = 0; i < line_->toks.size(); ++i) {
      const Token& token = line_->toks[i];
      nb::object type = token.removed() ? nb::none() : nb::object(nb::int_(TypeOfCode(token.code)));
      PyList_SET_ITEM(list.ptr(), i, type.release().ptr());
    }
    tok_types_ = std::move(list);
  }
  return tok_types_;
}

void LineObject::SetTokTypes(nb::handle list) {
  if (!PyList_Check(list.ptr())) ThrowExpected("list", list);
  tok_types_ = nb::borrow(list);
  has_host_tok_types_ = true;
  UpdateHooks();
}

nb::object LineObject::GetPositions() {
  if (!positions_.is_valid()) {
    const WithoutCollector all_at_once;
    const PositionView view = line_->positions();
    nb::object tuple = nb::steal(PyTuple_New(static_cast<Py_ssize_t>(view.size())));
    if (!tuple.is_valid()) throw nb::python_error();
    for (size_t i = 0; i < view.size(); ++i) {
      const Position position = view[i];
      PyTuple_SET_ITEM(tuple.ptr(), i, nb::make_tuple(position.line, position.col).release().ptr());
    }
    positions_ = std::move(tuple);
  }
  return positions_;
}

void LineObject::SetPositions(nb::handle sequence) {
  nb::object tuple = TupleOf(sequence);
  LetGo(line_->SetPositions(PositionsOf(tuple)));
  positions_ = std::move(tuple);
}

void LineObject::SetTokenCount(int32_t count) {
  line_->token_count = count;
  token_count_is_set_ = true;
}

void LineObject::Extend(RecordList& records, std::span<const Record> rows) {
  if (records.made == rows.size()) return;
  const WithoutCollector all_at_once;
  for (; records.made < rows.size(); ++records.made) {
    nb::object pair = nb::steal(PairOf(rows[records.made]));
    if (PyList_Append(records.list.ptr(), pair.ptr()) < 0) throw nb::python_error();
  }
}

nb::object LineObject::ReadRecords(RecordList& records, std::span<const Record> rows) {
  if (!records.list.is_valid()) {
    if (rows.empty()) return nb::none();
    const WithoutCollector all_at_once;
    nb::object list = nb::steal(PyList_New(static_cast<Py_ssize_t>(rows.size())));
    if (!list.is_valid()) throw nb::python_error();
    for (size_t i = 0; i < rows.size(); ++i) PyList_SET_ITEM(list.ptr(), i, PairOf(rows[i]));
    // Neither need it look at the list, of which there is one a line: the line that holds it is no
    // object of the collector's either.
    PyObject_GC_UnTrack(list.ptr());
    records.list = std::move(list);
    records.made = rows.size();
    UpdateHooks();
    return records.list;
  }
  Extend(records, rows);
  return records.list;
}

void LineObject::SetTypeEquivs(nb::handle list) {
  if (!list.is_none() && !PyList_Check(list.ptr())) ThrowExpected("list", list);
  // What the core holds is replaced: the argument records stay.
  nb::object arg_list = GetArgTypeEquivs();
  BuiltinClearDerivedInfo();
  if (!arg_list.is_none()) arg_equivs_ = {arg_list, 0};
  if (!list.is_none()) equivs_ = {nb::borrow(list), 0};
  UpdateHooks();
}

void LineObject::SetArgTypeEquivs(nb::handle list) {
  if (!list.is_none() && !PyList_Check(list.ptr())) ThrowExpected("list", list);
  nb::object other_list = GetTypeEquivs();
  BuiltinClearDerivedInfo();
  if (!other_list.is_none()) equivs_ = {other_list, 0};
  if (!list.is_none()) arg_equivs_ = {nb::borrow(list), 0};
  UpdateHooks();
}

bool LineObject::IsAtEndOfStore() const {
  const RecordStore& store = shared_->store;
  const auto ends_at = [](std::span<const Record> rows, const std::vector<Record>& all) {
    return rows.data() + rows.size() == all.data() + all.size();
  };
  return ends_at(line_->type_equivs(), store.rows) && ends_at(line_->arg_type_equivs(), store.arg_rows);
}

void LineObject::MoveToOwnStore() {
  const bool is_empty = line_->type_equivs().empty() && line_->arg_type_equivs().empty();
  if (is_empty && !writes_to_shared_) {
    LetGo(std::move(shared_));
    shared_.reset();  // the line makes a store of its own at its first record
    return;
  }
  auto own = std::make_shared<SharedStore>();
  const std::span<const Record> rows = line_->type_equivs();
  const std::span<const Record> arg_rows = line_->arg_type_equivs();
  const std::vector<Record> kept(rows.begin(), rows.end());
  const std::vector<Record> kept_args(arg_rows.begin(), arg_rows.end());
  line_->WriteTo(&own->store);
  const auto copy = [&own](Text text) { return own->store.texts.Copy(text); };
  for (const Record& row : kept) line_->DirectAppend(copy(row.name()), copy(row.info()));
  for (const Record& row : kept_args) line_->DirectAppendArg(copy(row.name()), copy(row.info()));
  // The store is private now, so the line is at its end for good.
  LetGo(std::exchange(shared_, std::move(own)));
  writes_to_shared_ = true;
}

void LineObject::BeginAnalysis() {
  if (line_->hooks != nullptr && is_python_subclass_) return BeginWriting();
  if (line_->hooks != nullptr) {
    equivs_ = {};
    arg_equivs_ = {};
    UpdateHooks();
  }
  if (shared_) {
    line_->WriteTo(&shared_->store);
    writes_to_shared_ = true;
  }
}

void LineObject::BeginWriting() {
  if (!shared_) return;
  if (!writes_to_shared_) {
    line_->WriteTo(&shared_->store);
    writes_to_shared_ = true;
  } else if (!IsAtEndOfStore()) {
    MoveToOwnStore();
  }
}

void LineObject::EndWriting() {
  const auto sync = [](RecordList& records, std::span<const Record> rows) {
    if (!records.list.is_valid()) return;
    if (rows.size() < records.made) {
      records = {};
    } else {
      Extend(records, rows);
    }
  };
  if (line_->hooks == nullptr) return;
  sync(equivs_, line_->type_equivs());
  sync(arg_equivs_, line_->arg_type_equivs());
  UpdateHooks();
}

int LineObject::BuiltinGetTokType(int64_t index) {
  if (!has_host_tok_types_ && !tok_types_.is_valid()) {
    const int64_t count = static_cast<int64_t>(line_->toks.size());
    if (index < 0) index += count;
    if (index < 0 || index >= count) ThrowError(ErrorKind::kIndexError, "list index out of range");
    const Token& token = line_->toks[index];
    if (!token.removed()) return TypeOfCode(token.code);
  }
  nb::object list = GetTokTypes();
  nb::object type = nb::steal(PySequence_GetItem(list.ptr(), static_cast<Py_ssize_t>(index)));
  if (!type.is_valid()) throw nb::python_error();
  return Int32Of(type);
}

void LineObject::BuiltinAppend(Text name, Text equiv) {
  BeginWriting();
  TextArena& texts = line_->texts();
  line_->DirectAppend(texts.Copy(name), texts.Copy(equiv));
  if (equivs_.list.is_valid()) Extend(equivs_, line_->type_equivs());
}

void LineObject::BuiltinAppendArg(Text name, Text info) {
  BeginWriting();
  TextArena& texts = line_->texts();
  line_->DirectAppendArg(texts.Copy(name), texts.Copy(info));
  if (arg_equivs_.list.is_valid()) Extend(arg_equivs_, line_->arg_type_equivs());
}

void LineObject::BuiltinClearDerivedInfo() {
  equivs_ = {};
  arg_equivs_ = {};
  if (IsUnderWay() && !writes_to_shared_) {
    // What the core has in hand may stand among the texts of the line's own store.
    if (!shared_) shared_ = std::make_shared<SharedStore>();
    writes_to_shared_ = true;
  }
  if (writes_to_shared_) {
    line_->WriteTo(&shared_->store);
  } else {
    line_->DirectClearDerivedInfo();
  }
  UpdateHooks();
}

nb::object LineObject::BuiltinGetExpLogicals() {
  const WithoutCollector all_at_once;
  EmbeddedLines embedded = line_->DirectGetExpLogicals();
  nb::object tuple = nb::steal(PyTuple_New(static_cast<Py_ssize_t>(embedded.owned.size())));
  if (!tuple.is_valid()) throw nb::python_error();
  for (size_t i = 0; i < embedded.owned.size(); ++i)
    PyTuple_SET_ITEM(tuple.ptr(), i, NewLineObject(std::move(embedded.owned[i])).release().ptr());
  return tuple;
}

// ---- hooks: an operation of the subclass, or the built-in behaviour ----

int LineObject::GetTokType(LogicalLine&, int64_t index) {
  if (is_python_subclass_) {
    return CallingHost([&] {
      nb::object override_op = OverrideOf(self_, g.get_tok_type);
      if (!override_op.is_valid()) return BuiltinGetTokType(index);
      return static_cast<int>(Int32Of(override_op(nb::handle(self_), index)));
    });
  }
  return CallingHost([&] { return BuiltinGetTokType(index); });
}

void LineObject::AppendTypeEquiv(LogicalLine&, Text name, Text equiv) {
  CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g.append) : nb::object();
    if (!override_op.is_valid()) return BuiltinAppend(name, equiv);
    override_op(nb::handle(self_), BytesOf(name), BytesOf(equiv));
  });
}

void LineObject::AppendArgTypeEquiv(LogicalLine&, Text name, Text info) {
  CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g.append_arg) : nb::object();
    if (!override_op.is_valid()) return BuiltinAppendArg(name, info);
    override_op(nb::handle(self_), BytesOf(name), BytesOf(info));
  });
}

void LineObject::SetParsed(LogicalLine&, bool parsed) {
  CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g.set_parsed) : nb::object();
    if (!override_op.is_valid()) {
      line_->parsed = parsed;
    } else {
      override_op(nb::handle(self_), parsed);
    }
  });
}

void LineObject::ClearDerivedInfo(LogicalLine&) {
  CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g.clear) : nb::object();
    if (!override_op.is_valid()) return BuiltinClearDerivedInfo();
    override_op(nb::handle(self_));
  });
}

EmbeddedLines LineObject::GetExpLogicals(LogicalLine& line) {
  return CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g.get_exp_logicals) : nb::object();
    if (!override_op.is_valid()) return line.DirectGetExpLogicals();
    nb::object result = override_op(nb::handle(self_));
    if (!PyTuple_Check(result.ptr())) ThrowExpected("tuple", result);
    EmbeddedLines embedded;
    const Py_ssize_t count = PyTuple_GET_SIZE(result.ptr());
    for (Py_ssize_t i = 0; i < count; ++i) {
      LineObject& element = LineOf(PyTuple_GET_ITEM(result.ptr(), i));
      element.MoveToOwnStore();  // its records come between those of this line
      embedded.lines.push_back(&element.line());
    }
    PyObject* tuple = result.release().ptr();
    embedded.keep_alive = std::shared_ptr<void>(tuple, [](void* object) { Py_DECREF(static_cast<PyObject*>(object)); });
    return embedded;
  });
}

void LineObject::CopyTypeEquivs(LogicalLine& from, LogicalLine& to) {
  CallingHost([&] {
    if (!equivs_.list.is_valid()) {
      // The line keeps its rows while the other one grows: both may write to one store.
      const std::span<const Record> rows = from.type_equivs();
      const std::vector<Record> copied(rows.begin(), rows.end());
      for (const Record& row : copied) to.AppendTypeEquiv(row.name(), row.info());
      return;
    }
    Extend(equivs_, from.type_equivs());
    nb::object list = equivs_.list;
    // A list that grows meanwhile (it may be that of the line that is copied to) is read to its old end.
    const Py_ssize_t count = PyList_GET_SIZE(list.ptr());
    for (Py_ssize_t i = 0; i < std::min(count, PyList_GET_SIZE(list.ptr())); ++i) {
      auto [name, equiv] = UnpackPair(PyList_GET_ITEM(list.ptr(), i));
      HostText keep_name, keep_equiv;
      const Text name_text = BytesOfHalf(name, keep_name);
      to.AppendTypeEquiv(name_text, BytesOfHalf(equiv, keep_equiv));
    }
  });
}

bool LineObject::GetHostArgRecords(LogicalLine& line, std::vector<std::pair<std::string, std::string>>& pairs) {
  if (!arg_equivs_.list.is_valid()) return false;
  CallingHost([&] {
    Extend(arg_equivs_, line.arg_type_equivs());
    nb::object list = arg_equivs_.list;
    for (Py_ssize_t i = 0; i < PyList_GET_SIZE(list.ptr()); ++i) {
      auto [name, info] = UnpackPair(PyList_GET_ITEM(list.ptr(), i));
      HostText keep_name, keep_info;
      const Text name_text = BytesOfHalf(name, keep_name);
      const Text info_text = BytesOfHalf(info, keep_info);
      pairs.emplace_back(name_text, info_text);
    }
  });
  return true;
}

bool LineObject::GetHostTokTypes(LogicalLine&, std::vector<int32_t>& types) {
  if (!has_host_tok_types_) return false;
  for (Py_ssize_t i = 0; i < PyList_GET_SIZE(tok_types_.ptr()); ++i) {
    PyObject* type = PyList_GET_ITEM(tok_types_.ptr(), i);
    int overflow = 0;
    const long number = PyLong_Check(type) ? PyLong_AsLongAndOverflow(type, &overflow) : -1;
    const bool is_type = overflow == 0 && number >= 0 && number <= std::numeric_limits<int32_t>::max();
    types.push_back(is_type ? static_cast<int32_t>(number) : -1);
  }
  return true;
}

Recording::~Recording() {
  if (line_ == nullptr) return;
  try {
    line_->EndWriting();
  } catch (nb::python_error& error) {
    error.discard_as_unraisable("CLogicalLine");  // no memory for a list; the next read makes it
  }
}

// ---- instances ----

LineObject& LineOf(nb::handle object) {
  LineObject* line = InstanceOf<LineObject>(object);
  if (line == nullptr) ThrowExpected("CLogicalLine", object);
  return *line;
}

namespace {

template <class... Args>
nb::object NewInstance(Args&&... args) {
  nb::object instance = nb::inst_alloc(nb::handle((PyObject*)g.line_type));
  LineObject* object = nb::inst_ptr<LineObject>(instance);
  new (object) LineObject(std::forward<Args>(args)...);
  nb::inst_mark_ready(instance);
  object->Attach(instance.ptr());
  return instance;
}

}  // namespace

nb::object NewLineObject(std::unique_ptr<LogicalLine> made) { return NewInstance(std::move(made)); }

nb::object NewLineObject(const Ref<SourceText>& source, const LineRow& row,
                         const std::shared_ptr<SharedStore>& shared) {
  nb::object instance = NewInstance();
  nb::inst_ptr<LineObject>(instance)->SetRow(source, row, shared);
  return instance;
}

nb::object CutToTuple(const Ref<SourceText>& source, Version version) {
  std::vector<LineRow> rows;
  CutLines(*source, version, rows);
  auto shared = std::make_shared<SharedStore>();
  const WithoutCollector all_at_once;
  nb::object tuple = nb::steal(PyTuple_New(static_cast<Py_ssize_t>(rows.size())));
  if (!tuple.is_valid()) throw nb::python_error();
  for (size_t i = 0; i < rows.size(); ++i)
    PyTuple_SET_ITEM(tuple.ptr(), i, NewLineObject(source, rows[i], shared).release().ptr());
  return tuple;
}

namespace {

void InitLine(nb::pointer_and_handle<LineObject> self, Any type, Any toks, Any positions, Any tok_types, Any parsed,
              Any first_line, Any token_count) {
  auto* object = new (self.p) LineObject();
  try {
    object->SetType(type);
    object->SetPositions(positions);
    object->SetToks(toks);
    if (!tok_types.is_none()) object->SetTokTypes(tok_types);
    const int truth = PyObject_IsTrue(parsed.ptr());
    if (truth < 0) throw nb::python_error();
    object->line().parsed = truth != 0;
    object->line().first_line = Int32Of(first_line);
    if (!token_count.is_none()) object->SetTokenCount(Int32Of(token_count));
    object->Attach(self.h.ptr());
  } catch (...) {
    object->~LineObject();
    throw;
  }
}

void RememberOperation(Shared::Operation& operation, nb::handle type, const char* name) {
  operation.name = PyUnicode_InternFromString(name);
  operation.builtin = type.attr(name).ptr();  // kept by the type
}

// The version that a host gives, or that of the interpreter.
Version VersionOrOwn(nb::handle version_triple) {
  return version_triple.is_none() ? Version{{PY_MAJOR_VERSION, PY_MINOR_VERSION, PY_MICRO_VERSION}, 3}
                                  : VersionOf(version_triple);
}

nb::object GetLogicalsFromText(Any text, Any version_triple) {
  HostText host_text = HostText::FromStrOrBytes(text);
  return CutToTuple(SourceText::Copy(host_text.text()), VersionOrOwn(version_triple));
}

nb::object FindKind(nb::handle toks, int64_t start, int64_t end) {
  nb::object tuple = TupleOf(toks);
  Ref<SourceText> source = SourceOfTokens(tuple);
  const int64_t count = static_cast<int64_t>(source->tokens.size());
  start = start < 0 ? 0 : start;
  end = end > count ? count : end;
  const LineKind kind = start < end ? FindMatchOrCaseType(source->tokens, start, end) : LineKind::kUnknown;
  return nb::borrow(g.kind_texts[static_cast<int>(kind)]);
}

}  // namespace

void BindLogicalline(nb::module_& tarvex) {
  nb::module_ m = SiblingModule(tarvex, "logicalline");
  m.attr("__name__") = "quillet.logicalline";

#define QUILLET_LINE_KIND(identifier, text) \
  g.kind_texts[static_cast<int>(LineKind::k##identifier)] = PyUnicode_InternFromString(text);
#include "lines/line_kinds.def"
#define QUILLET_LINE_KIND(identifier, text) \
  m.attr("k" #identifier) = nb::borrow(g.kind_texts[static_cast<int>(LineKind::k##identifier)]);
#include "lines/line_kinds.def"
  m.attr("kErrorTokenPrefix") = "error";

  nb::class_<LineObject> cls(m, "CLogicalLine",
                             "One logical line of Python: its tokens, and what analysis recorded on it.");
  g.line_type = (PyTypeObject*)cls.ptr();
  cls.def("__init__", &InitLine, nb::arg("type") = nb::str("unknown"), nb::arg("toks") = nb::tuple(),
          nb::arg("positions") = nb::tuple(), nb::arg("tok_types") = nb::none(), nb::arg("parsed") = false,
          nb::arg("first_line") = 0, nb::arg("token_count") = nb::none());
  cls.def_prop_rw(
      "fType", [](LineObject& self) { return self.GetType(); },
      [](LineObject& self, Any value) { self.SetType(value); });
  cls.def_prop_rw(
      "fToks", [](LineObject& self) { return self.GetToks(); },
      [](LineObject& self, Any value) { self.SetToks(value); });
  cls.def_prop_rw(
      "fTokTypes", [](LineObject& self) { return self.GetTokTypes(); },
      [](LineObject& self, Any value) { self.SetTokTypes(value); });
  cls.def_prop_rw(
      "fPositions", [](LineObject& self) { return self.GetPositions(); },
      [](LineObject& self, Any value) { self.SetPositions(value); });
  cls.def_prop_rw(
      "fParsed", [](LineObject& self) { return self.line().parsed; },
      [](LineObject& self, Truth value) { self.line().parsed = value; });
  cls.def_prop_rw(
      "fFirstLine", [](LineObject& self) { return self.line().first_line; },
      [](LineObject& self, Any value) { self.line().first_line = Int32Of(value); });
  cls.def_prop_rw(
      "fTokenCount", [](LineObject& self) { return self.GetTokenCount(); },
      [](LineObject& self, Any value) { self.SetTokenCount(Int32Of(value)); });
  cls.def_prop_rw(
      "fTypeEquivs", [](LineObject& self) { return self.GetTypeEquivs(); },
      [](LineObject& self, Any value) { self.SetTypeEquivs(value); }, nb::arg("value"));
  cls.def_prop_rw(
      "fArgTypeEquivs", [](LineObject& self) { return self.GetArgTypeEquivs(); },
      [](LineObject& self, Any value) { self.SetArgTypeEquivs(value); }, nb::arg("value"));

  cls.def(
      "GetTokType", [](LineObject& self, Any i) { return self.BuiltinGetTokType(Int64Of(i)); }, nb::arg("i"),
      "The token type id of token `i`.");
  cls.def(
      "AppendTypeEquiv",
      [](LineObject& self, Any name, Any equiv) {
        const HostText name_text = HostText::FromBytes(name);
        const HostText equiv_text = HostText::FromBytes(equiv);
        self.BuiltinAppend(name_text.text(), equiv_text.text());
      },
      nb::arg("name"), nb::arg("equiv"), "Appends a record of a name in the statement's own scope.");
  cls.def(
      "AppendArgTypeEquiv",
      [](LineObject& self, Any name, Any info) {
        const HostText name_text = HostText::FromBytes(name);
        const HostText info_text = HostText::FromBytes(info);
        self.BuiltinAppendArg(name_text.text(), info_text.text());
      },
      nb::arg("name"), nb::arg("info"), "Appends a record of a parameter of the scope that the statement opens.");
  cls.def(
      "SetParsed", [](LineObject& self, Truth parsed) { self.line().parsed = parsed; }, nb::arg("parsed"));
  cls.def(
      "ClearDerivedInfo", [](LineObject& self) { self.BuiltinClearDerivedInfo(); },
      "Removes everything that analysis wrote on the line.");
  cls.def(
      "GetExpLogicals", [](LineObject& self) { return self.BuiltinGetExpLogicals(); },
      "The expressions embedded in the line (f-string fields, stringified and commented hints).");
  cls.def("__repr__",
          [](LineObject& self) { return nb::str("<CLogicalLine {} {!r}>").format(self.GetType(), self.GetToks()); });

  RememberOperation(g.get_tok_type, cls, "GetTokType");
  RememberOperation(g.append, cls, "AppendTypeEquiv");
  RememberOperation(g.append_arg, cls, "AppendArgTypeEquiv");
  RememberOperation(g.set_parsed, cls, "SetParsed");
  RememberOperation(g.clear, cls, "ClearDerivedInfo");
  RememberOperation(g.get_exp_logicals, cls, "GetExpLogicals");

  m.def("GetLogicalsFromText", &GetLogicalsFromText, nb::arg("text"), nb::arg("version_triple") = nb::none(),
        "The logical lines of a text, in order, as a tuple of CLogicalLine.");
  m.def(
      "FindMatchOrCaseType", [](Any toks, Any start, Any end) { return FindKind(toks, Int64Of(start), Int64Of(end)); },
      nb::arg("toks"), nb::arg("start"), nb::arg("end"),
      "kMatch or kCase where the tokens are such a statement's head, kUnknown otherwise.");
  m.def(
      "IsScopeStartLogical", [](Any logical) { return IsScopeStartLogical(LineOf(logical).line()); },
      nb::arg("logical"), "True for a line that opens a scope: def, async def, class.");

  nb::module_ inspect = SiblingModule(tarvex, "logicalinspect");
  inspect.def(
      "_TextFromLine", [](Any logical) { return StrOf(TextFromTokens(LineOf(logical).line())); }, nb::arg("logical"));
  inspect.def(
      "_TextFromToks",
      [](Any toks, Any positions) {
        nb::object tuple = TupleOf(toks);
        Ref<SourceText> source = SourceOfTokens(tuple);
        const std::vector<Position> stored = PositionsOf(TupleOf(positions));
        return StrOf(TextFromTokens(source->tokens, PositionView(stored)));
      },
      nb::arg("toks"), nb::arg("positions"));
}

}  // namespace quillet::host
