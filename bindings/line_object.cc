// The fields of a CLogicalLine as the host reads and sets them, its records, and new instances. See line_object.h.
#include "bindings/line_object.h"

#include <memory>
#include <utility>
#include <vector>

#include "bindings/bytes_cache.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/line_class.h"
#include "lines/cutter.h"

namespace quillet::host {
namespace {

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

void LineObject::Attach(PyObject* self) {
  self_ = self;
  is_python_subclass_ = Py_TYPE(self) != g_line_class.line_type;
  UpdateHooks();
}

void LineObject::UpdateHooks() {
  const bool seen =
      is_python_subclass_ || has_host_tok_types_ || equivs_.list.is_valid() || arg_equivs_.list.is_valid();
  line_->hooks = seen ? this : nullptr;
}

void LineObject::SetRow(const Ref<SharedCut>& cut, const LineRow& row) {
  SetFromRow(*line_, *cut->source, row);
  cut_ = cut;
}

nb::object LineObject::GetType() const {
  if (line_->kind == LineKind::kOther) return type_;
  return nb::borrow(g_line_class.kind_texts[static_cast<int>(line_->kind)]);
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
  LetGo(line_->HoldSource(source));
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
  const RecordStore& store = cut_->store;
  const auto ends_at = [](std::span<const Record> rows, const std::vector<Record>& all) {
    return rows.data() + rows.size() == all.data() + all.size();
  };
  return ends_at(line_->type_equivs(), store.rows) && ends_at(line_->arg_type_equivs(), store.arg_rows);
}

void LineObject::MoveToOwnStore() {
  if (cut_ && line_->source == cut_->source.get()) LetGo(line_->HoldSource(cut_->source));
  const bool is_empty = line_->type_equivs().empty() && line_->arg_type_equivs().empty();
  if (is_empty && !writes_to_cut_) {
    LetGo(std::move(cut_));  // the line makes a store of its own at its first record
    return;
  }
  const Ref<SharedCut> own(new SharedCut({}));
  const std::span<const Record> rows = line_->type_equivs();
  const std::span<const Record> arg_rows = line_->arg_type_equivs();
  const std::vector<Record> kept(rows.begin(), rows.end());
  const std::vector<Record> kept_args(arg_rows.begin(), arg_rows.end());
  line_->WriteTo(&own->store);
  const auto copy = [&own](Text text) { return own->store.texts.Copy(text); };
  for (const Record& row : kept) line_->DirectAppend(copy(row.name()), copy(row.info()));
  for (const Record& row : kept_args) line_->DirectAppendArg(copy(row.name()), copy(row.info()));
  // The store is private now, so the line is at its end for good.
  LetGo(std::exchange(cut_, own));
  writes_to_cut_ = true;
}

void LineObject::BeginAnalysis() {
  if (line_->hooks != nullptr && is_python_subclass_) return BeginWriting();
  if (line_->hooks != nullptr) {
    equivs_ = {};
    arg_equivs_ = {};
    UpdateHooks();
  }
  if (cut_) {
    line_->WriteTo(&cut_->store);
    writes_to_cut_ = true;
  }
}

void LineObject::BeginWriting() {
  if (!cut_) return;
  if (!writes_to_cut_) {
    line_->WriteTo(&cut_->store);
    writes_to_cut_ = true;
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
  if (IsUnderWay() && !writes_to_cut_) {
    // What the core has in hand may stand among the texts of the line's own store.
    if (!cut_) cut_ = new SharedCut({});
    writes_to_cut_ = true;
  }
  if (writes_to_cut_) {
    line_->WriteTo(&cut_->store);
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

Recording::~Recording() {
  if (line_ == nullptr) return;
  try {
    line_->EndWriting();
  } catch (nb::python_error& error) {
    error.discard_as_unraisable("CLogicalLine");  // no memory for a list; the next read makes it
  }
}

// ---- instances ----

namespace {

// A new instance, whose line `construct` makes in its place.
template <class Construct>
nb::object NewInstance(Construct&& construct) {
  auto* instance = PyObject_New(LineInstance, g_line_class.line_type);
  if (instance == nullptr) throw nb::python_error();
  construct(&instance->line);
  auto* const self = reinterpret_cast<PyObject*>(instance);
  instance->line.Attach(self);
  return nb::steal(self);
}

}  // namespace

nb::object NewLineObject(std::unique_ptr<LogicalLine> made) {
  return NewInstance([&made](void* place) { new (place) LineObject(std::move(made)); });
}

nb::object NewLineObject(const Ref<SharedCut>& cut, const LineRow& row) {
  // Without parentheses, which would have all of it filled with zeros beforehand.
  return NewInstance([&](void* place) { (new (place) LineObject)->SetRow(cut, row); });
}

nb::object CutToTuple(const Ref<SourceText>& source, Version version) {
  std::vector<LineRow> rows;
  CutLines(*source, version, rows);
  const Ref<SharedCut> cut(new SharedCut(source));
  const WithoutCollector all_at_once;
  nb::object tuple = nb::steal(PyTuple_New(static_cast<Py_ssize_t>(rows.size())));
  if (!tuple.is_valid()) throw nb::python_error();
  for (size_t i = 0; i < rows.size(); ++i)
    PyTuple_SET_ITEM(tuple.ptr(), i, NewLineObject(cut, rows[i]).release().ptr());
  return tuple;
}

}  // namespace quillet::host
