// The object behind a CLogicalLine of the host: a logical line of the core, and what the host has
// read of it or put in its place. The class itself is in line_type.cc.
//
// Token tuples, positions and record lists are made when the host reads them. A record list that
// was read stays the same object as long as nothing is cleared, and is extended by later reads; a
// list that the host assigned is kept as it is, and appended to.
//
// A line has hooks only where the host may see an operation: an instance of a Python subclass, or a
// line with a record list or token types of the host's. Any other line runs at the core's speed.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/line_class.h"
#include "foundations/ref.h"
#include "lines/cutter.h"
#include "lines/logical_line.h"

namespace quillet::host {

// What the lines cut out of one source have in common: the source, and the records of all of them. Lines write to the
// end of the store one after another; one that is written to out of turn moves to a store of its own.
//
// Every line counts here, and only with the interpreter lock held: the counter is a plain one.
struct SharedCut {
  explicit SharedCut(Ref<SourceText> of) : source(std::move(of)) {}

  void AddRef() const { ++refs; }
  void Release() const {
    if (--refs == 0) delete this;
  }
  bool IsUnique() const { return refs == 1; }

  const Ref<SourceText> source;
  RecordStore store;
  mutable size_t refs = 0;
};

class LineObject final : public LineHooks {
 public:
  LineObject() = default;
  LineObject(const LineObject&) = delete;
  LineObject& operator=(const LineObject&) = delete;
  ~LineObject() override = default;

  // A line that the core made, such as an embedded expression.
  explicit LineObject(std::unique_ptr<LogicalLine> made) : line_(made.get()), made_(std::move(made)) {}

  LogicalLine& line() { return *line_; }

  // Binds the object to the host's instance around it, which from then on serves as a line, and finds out whether that
  // may override.
  void Attach(PyObject* self);
  PyObject* self() const { return self_; }
  bool is_python_subclass() const { return is_python_subclass_; }

  // Fills the line from a row of a cut source.
  void SetRow(const Ref<SharedCut>& cut, const LineRow& row);

  // Says that the row was analysed already, and which records of the shared store are its.
  void SetAnalyzed(uint32_t begin, uint32_t end, uint32_t arg_begin, uint32_t arg_end) {
    line_->ReadFrom(&cut_->store, begin, end, arg_begin, arg_end);
    line_->parsed = true;
    writes_to_cut_ = true;
  }

  // ---- fields ----
  nb::object GetType() const;
  void SetType(nb::handle text);
  nb::object GetToks();
  void SetToks(nb::handle sequence);
  nb::object GetTokTypes();
  void SetTokTypes(nb::handle list);
  nb::object GetPositions();
  void SetPositions(nb::handle sequence);
  int32_t GetTokenCount() const { return line_->token_count; }
  void SetTokenCount(int32_t count);
  nb::object GetTypeEquivs() { return ReadRecords(equivs_, line_->type_equivs()); }
  nb::object GetArgTypeEquivs() { return ReadRecords(arg_equivs_, line_->arg_type_equivs()); }
  void SetTypeEquivs(nb::handle list);
  void SetArgTypeEquivs(nb::handle list);

  // ---- around an operation of the core that writes records on the line ----
  // Before an analysis, which begins by clearing: records go to the end of the shared store again.
  void BeginAnalysis();
  // Before any other writing.
  void BeginWriting();
  // After either: a list that the host holds is brought up to date.
  void EndWriting();

  // ---- the built-in behaviour of the operations ----
  int BuiltinGetTokType(int64_t index);
  void BuiltinAppend(Text name, Text equiv);
  void BuiltinAppendArg(Text name, Text info);
  void BuiltinClearDerivedInfo();
  nb::object BuiltinGetExpLogicals();

  // ---- LineHooks ----
  int GetTokType(LogicalLine& line, int64_t index) override;
  void AppendTypeEquiv(LogicalLine& line, Text name, Text equiv) override;
  void AppendArgTypeEquiv(LogicalLine& line, Text name, Text info) override;
  void SetParsed(LogicalLine& line, bool parsed) override;
  void ClearDerivedInfo(LogicalLine& line) override;
  EmbeddedLines GetExpLogicals(LogicalLine& line) override;
  void CopyTypeEquivs(LogicalLine& from, LogicalLine& to) override;
  bool GetHostArgRecords(LogicalLine& line, std::vector<std::pair<std::string, std::string>>& pairs) override;
  bool GetHostTokTypes(LogicalLine& line, std::vector<int32_t>& types) override;

 private:
  // A record list of the host's: `list` is None or a list; the first `made` rows are in it.
  struct RecordList {
    nb::object list;
    size_t made = 0;
  };

  nb::object ReadRecords(RecordList& records, std::span<const Record> rows);
  static void Extend(RecordList& records, std::span<const Record> rows);
  void MoveToOwnStore();
  void UpdateHooks();
  bool IsAtEndOfStore() const;

  LogicalLine own_;
  LogicalLine* line_ = &own_;
  std::unique_ptr<LogicalLine> made_;
  // The line's source is that of the cut, or one that the line holds; its records are in the cut's store, or in one of
  // its own.
  Ref<SharedCut> cut_;
  PyObject* self_ = nullptr;
  bool is_python_subclass_ = false;
  bool token_count_is_set_ = false;
  bool has_host_tok_types_ = false;
  bool writes_to_cut_ = false;
  nb::object type_;  // a kind of the host's own
  nb::object toks_;  // tuples, made or given
  nb::object positions_;
  nb::object tok_types_;  // list
  RecordList equivs_;
  RecordList arg_equivs_;
};

// Around an operation that may write records on a line: brings the lists that the host holds of them
// up to date on every way out.
class Recording {
 public:
  explicit Recording(LineObject* line) : line_(line) {
    if (line_ != nullptr) line_->BeginWriting();
  }
  // The line of a walk that the host is in the middle of, if any.
  explicit Recording(LogicalLine* line) : line_(line == nullptr ? nullptr : dynamic_cast<LineObject*>(line->hooks)) {}
  ~Recording();
  Recording(const Recording&) = delete;
  Recording& operator=(const Recording&) = delete;

 private:
  LineObject* line_;
};

// An instance of CLogicalLine or of a class of the host's that derives from it.
struct LineInstance {
  PyObject_HEAD;
  LineObject line;
};

// A new CLogicalLine of the host around a line of the core.
nb::object NewLineObject(std::unique_ptr<LogicalLine> made);
// One for a row of a cut source.
nb::object NewLineObject(const Ref<SharedCut>& cut, const LineRow& row);
// All logical lines of a source, as a tuple of CLogicalLine.
nb::object CutToTuple(const Ref<SourceText>& source, Version version);
// The object behind a CLogicalLine; null for anything else, and for an instance of a host's class whose __init__ did
// not call that of its base.
inline LineObject* LineOrNull(nb::handle object) {
  if (!PyObject_TypeCheck(object.ptr(), g_line_class.line_type)) return nullptr;
  LineObject& line = reinterpret_cast<LineInstance*>(object.ptr())->line;
  return line.self() != nullptr ? &line : nullptr;
}
// The same; TypeError "Expected CLogicalLine, got ..." for anything else.
inline LineObject& LineOf(nb::handle object) {
  LineObject* const line = LineOrNull(object);
  if (line == nullptr) [[unlikely]]
    ThrowExpected("CLogicalLine", object);
  return *line;
}

// Makes the class CLogicalLine, which has its constructor and the record lists so far.
nb::object MakeLineClass();
// Adds the class CutSource.
void BindCutSource(nb::module_& host);

// Records of the host that are pairs: unpacked strictly.
std::pair<nb::object, nb::object> UnpackPair(nb::handle pair);

}  // namespace quillet::host

namespace nanobind::detail {

template <>
struct type_caster<quillet::host::LineObject> {
  static constexpr auto Name = const_name("CLogicalLine");
  template <class>
  using Cast = quillet::host::LineObject&;

  bool from_python(handle src, uint8_t, cleanup_list*) noexcept {
    line_ = quillet::host::LineOrNull(src);
    return line_ != nullptr;
  }
  operator quillet::host::LineObject&() { return *line_; }  // NOLINT(google-explicit-constructor): as casters are

 private:
  quillet::host::LineObject* line_ = nullptr;
};

}  // namespace nanobind::detail
