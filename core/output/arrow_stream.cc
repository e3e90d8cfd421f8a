// Every structure is owned by its private_data: releasing one frees what it holds and releases its
// children, unless a reader moved them away, as the interface allows.
#include "output/arrow_stream.h"

#include <algorithm>
#include <cerrno>
#include <exception>
#include <functional>
#include <span>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "foundations/shown_text.h"
#include "names/bindings.h"

namespace quillet {

namespace {

// Rows that make a batch worth while.
constexpr size_t kBatchRows = size_t{1} << 16;

// ---- the schema ----

struct Column {
  const char* name;
  const char* format;
  bool has_dictionary;  // of large_utf8
  bool may_be_null = false;
};

constexpr Column kRecordColumns[] = {
    {"path", "i", true},  {"line", "I", false}, {"column", "I", false}, {"scope", "U", false},
    {"name", "U", false}, {"kind", "c", true},  {"detail", "U", false}, {"is_parameter", "b", false},
};

constexpr Column kOccurrenceColumns[] = {
    {"path", "i", true},
    {"index", "I", false},
    {"line", "I", false},
    {"column", "I", false},
    {"end_column", "I", false},
    {"text", "U", false},
    {"role", "c", true},
    {"kind", "c", true, true},
#define QUILLET_NAME_FLAG(identifier, number, word) {word, "b", false},
#include "names/words.def"
    {"receiver", "I", false, true},
    {"is_attribute", "b", false},
    {"scope", "I", false},
    {"scope_name", "U", false},
    {"symbol", "I", false, true},
    {"symbol_name", "U", false, true},
};

struct OwnedSchema {
  std::vector<ArrowSchema> children;
  std::vector<ArrowSchema*> child_pointers;
  std::unique_ptr<ArrowSchema> dictionary;
};

void ReleaseSchema(ArrowSchema* schema) {
  const std::unique_ptr<OwnedSchema> owned(static_cast<OwnedSchema*>(schema->private_data));
  for (ArrowSchema& child : owned->children) {
    if (child.release != nullptr) child.release(&child);
  }
  if (owned->dictionary && owned->dictionary->release != nullptr) owned->dictionary->release(owned->dictionary.get());
  schema->release = nullptr;
}

// `owned` becomes the schema's.
void FillSchema(const char* name, const char* format, std::unique_ptr<OwnedSchema> owned, ArrowSchema* schema) {
  for (ArrowSchema& child : owned->children) owned->child_pointers.push_back(&child);
  *schema = {};
  schema->format = format;
  schema->name = name;
  schema->n_children = static_cast<int64_t>(owned->children.size());
  schema->children = owned->child_pointers.data();
  schema->dictionary = owned->dictionary.get();
  schema->release = ReleaseSchema;
  schema->private_data = owned.release();
}

void FillTableSchema(std::span<const Column> columns, ArrowSchema* schema) {
  constexpr int64_t kNullable = 2;
  auto table = std::make_unique<OwnedSchema>();
  table->children.resize(columns.size());
  for (size_t i = 0; i < columns.size(); ++i) {
    auto column = std::make_unique<OwnedSchema>();
    if (columns[i].has_dictionary) {
      column->dictionary = std::make_unique<ArrowSchema>();
      FillSchema("", "U", std::make_unique<OwnedSchema>(), column->dictionary.get());
    }
    FillSchema(columns[i].name, columns[i].format, std::move(column), &table->children[i]);
    if (columns[i].may_be_null) table->children[i].flags = kNullable;
  }
  FillSchema("", "+s", std::move(table), schema);
}

// ---- arrays ----

struct OwnedArray {
  std::vector<const void*> buffers;
  std::vector<ArrowArray> children;
  std::vector<ArrowArray*> child_pointers;
  std::unique_ptr<ArrowArray> dictionary;
  std::shared_ptr<const void> keep;  // what the buffers are in
};

void ReleaseArray(ArrowArray* array) {
  const std::unique_ptr<OwnedArray> owned(static_cast<OwnedArray*>(array->private_data));
  for (ArrowArray& child : owned->children) {
    if (child.release != nullptr) child.release(&child);
  }
  if (owned->dictionary && owned->dictionary->release != nullptr) owned->dictionary->release(owned->dictionary.get());
  array->release = nullptr;
}

void FillArray(size_t length, std::unique_ptr<OwnedArray> owned, ArrowArray* array) {
  for (ArrowArray& child : owned->children) owned->child_pointers.push_back(&child);
  *array = {};
  array->length = static_cast<int64_t>(length);
  array->n_buffers = static_cast<int64_t>(owned->buffers.size());
  array->buffers = owned->buffers.data();
  array->n_children = static_cast<int64_t>(owned->children.size());
  array->children = owned->child_pointers.data();
  array->dictionary = owned->dictionary.get();
  array->release = ReleaseArray;
  array->private_data = owned.release();
}

// The dictionaries of a stream: all of its batches have the same ones, each text once.
struct Dictionaries {
  TextList paths;
  TextList record_kinds;
  TextList roles;
  TextList name_kinds;
  std::vector<int32_t> path_of_input;  // index in paths

  explicit Dictionaries(const std::vector<BatchInput>& inputs)
      : record_kinds(ListOf(RecordKindWords())), roles(ListOf(NameRoleWords())), name_kinds(ListOf(NameKindWords())) {
    std::unordered_map<std::string, int32_t> numbers;
    path_of_input.reserve(inputs.size());
    for (const BatchInput& input : inputs) {
      std::string shown;
      AppendShown(input.path, shown);
      const auto [known, is_new] = numbers.try_emplace(std::move(shown), static_cast<int32_t>(paths.size()));
      if (is_new) paths.Add(known->first);
      path_of_input.push_back(known->second);
    }
  }

  static TextList ListOf(std::span<const Text> words) {
    TextList list;
    for (const Text word : words) list.Add(word);
    return list;
  }
};

// Truth values, a bit each.
class Bits {
 public:
  void Add(bool value) {
    if (size_ % 8 == 0) bytes_.push_back(0);
    if (value) bytes_.back() = static_cast<uint8_t>(bytes_.back() | 1u << size_ % 8);
    ++size_;
    false_count_ += !value;
  }
  const void* data() const { return bytes_.data(); }
  size_t false_count() const { return false_count_; }

 private:
  std::vector<uint8_t> bytes_;
  size_t size_ = 0;
  size_t false_count_ = 0;
};

// The buffers of one column.
struct ColumnBuffers {
  std::vector<const void*> values;
  const TextList* dictionary = nullptr;
  const Bits* validity = nullptr;  // without it, no row is null

  static ColumnBuffers Of(const TextList& texts, const Bits* validity = nullptr) {
    return {{texts.offsets.data(), texts.bytes.data()}, nullptr, validity};
  }
};

// The rows of several files as columns.
class ColumnTable {
 public:
  virtual ~ColumnTable() = default;
  virtual size_t size() const = 0;
  virtual void Add(const BatchResult& result) = 0;
  // In the order of the schema. They stand as long as nothing is added.
  virtual std::vector<ColumnBuffers> Buffers() const = 0;
};

template <class To, class From>
void Append(To& to, const From& from) {
  to.insert(to.end(), from.begin(), from.end());
}

class RecordColumns : public ColumnTable {
 public:
  static constexpr std::span<const Column> kSchema = kRecordColumns;

  explicit RecordColumns(std::shared_ptr<const Dictionaries> dictionaries) : dictionaries_(std::move(dictionaries)) {}

  size_t size() const override { return lines_.size(); }

  void Add(const BatchResult& result) override {
    const RecordTable& table = result.table;
    paths_.insert(paths_.end(), table.size(), dictionaries_->path_of_input[result.index]);
    Append(lines_, table.lines);
    Append(columns_, table.columns);
    Append(kinds_, table.kinds);
    for (size_t i = 0; i < table.size(); ++i) {
      scopes_.Add(table.ScopeAt(i));
      names_.Add(table.NameAt(i));
      details_.Add(table.DetailAt(i));
      are_parameters_.Add(table.is_parameter[i] != 0);
    }
  }

  std::vector<ColumnBuffers> Buffers() const override {
    return {
        {{paths_.data()}, &dictionaries_->paths},
        {{lines_.data()}},
        {{columns_.data()}},
        ColumnBuffers::Of(scopes_),
        ColumnBuffers::Of(names_),
        {{kinds_.data()}, &dictionaries_->record_kinds},
        ColumnBuffers::Of(details_),
        {{are_parameters_.data()}},
    };
  }

 private:
  std::shared_ptr<const Dictionaries> dictionaries_;
  std::vector<int32_t> paths_;
  std::vector<uint32_t> lines_;
  std::vector<uint32_t> columns_;
  TextList scopes_;
  TextList names_;
  std::vector<RecordKind> kinds_;
  TextList details_;
  Bits are_parameters_;
};

class OccurrenceColumns : public ColumnTable {
 public:
  static constexpr std::span<const Column> kSchema = kOccurrenceColumns;

  explicit OccurrenceColumns(std::shared_ptr<const Dictionaries> dictionaries)
      : dictionaries_(std::move(dictionaries)), flags_(NameFlagWords().size()) {}

  size_t size() const override { return indices_.size(); }

  void Add(const BatchResult& result) override {
    if (!result.bindings) return;
    const Bindings& bindings = *result.bindings;
    const std::vector<std::string> scope_names = QualifiedNames(bindings);
    const size_t count = bindings.occurrences.size();
    paths_.insert(paths_.end(), count, dictionaries_->path_of_input[result.index]);
    for (uint32_t i = 0; i < count; ++i) AddOne(bindings, i, scope_names);
  }

  std::vector<ColumnBuffers> Buffers() const override {
    std::vector<ColumnBuffers> buffers = {
        {{paths_.data()}, &dictionaries_->paths},
        {{indices_.data()}},
        {{lines_.data()}},
        {{columns_.data()}},
        {{end_columns_.data()}},
        ColumnBuffers::Of(texts_),
        {{roles_.data()}, &dictionaries_->roles},
        {{kinds_.data()}, &dictionaries_->name_kinds, &have_kinds_},
    };
    for (const Bits& flag : flags_) buffers.push_back({{flag.data()}});
    Append(buffers, std::vector<ColumnBuffers>{
                        {{receivers_.data()}, nullptr, &have_receivers_},
                        {{are_attributes_.data()}},
                        {{scopes_.data()}},
                        ColumnBuffers::Of(scope_names_),
                        {{symbols_.data()}, nullptr, &have_symbols_},
                        ColumnBuffers::Of(symbol_names_, &have_symbols_),
                    });
    return buffers;
  }

 private:
  // Of classes and functions, such as "Shop.total"; of what is nested in one without a name, that one's.
  static std::vector<std::string> QualifiedNames(const Bindings& bindings) {
    std::vector<std::string> names;
    for (const NameScope& scope : bindings.scopes) {
      std::string name = scope.parent == kNoIndex ? std::string() : names[scope.parent];
      if (scope.kind == NameScopeKind::kClass || scope.kind == NameScopeKind::kFunction) {
        if (!name.empty()) name += '.';
        AppendShown(bindings.texts[scope.name], name);
      }
      names.push_back(std::move(name));
    }
    return names;
  }

  void AddOne(const Bindings& bindings, uint32_t i, const std::vector<std::string>& scope_names) {
    const Occurrence& occurrence = bindings.occurrences[i];
    const Position place = bindings.PositionOf(occurrence.begin);
    const uint32_t column = static_cast<uint32_t>(place.col) + 1;
    indices_.push_back(i);
    lines_.push_back(static_cast<uint32_t>(place.line) + 1);
    columns_.push_back(column);
    end_columns_.push_back(column + static_cast<uint32_t>(bindings.TextOf(occurrence).size()));
    AddShown(bindings.TextOf(occurrence), texts_);
    roles_.push_back(static_cast<int8_t>(occurrence.role));
    have_kinds_.Add(occurrence.kind != NameKind::kNone);
    kinds_.push_back(static_cast<int8_t>(std::max(static_cast<int>(occurrence.kind) - 1, 0)));
    for (size_t bit = 0; bit < flags_.size(); ++bit) flags_[bit].Add((occurrence.flags >> bit & 1) != 0);
    const uint32_t receiver = bindings.ReceiverOf(i);
    have_receivers_.Add(receiver != kNoIndex);
    receivers_.push_back(receiver != kNoIndex ? receiver : 0);
    are_attributes_.Add(occurrence.is_attribute);
    const uint32_t scope = bindings.ScopeOf(occurrence);
    scopes_.push_back(scope);
    scope_names_.Add(scope_names[scope]);
    const uint32_t symbol = bindings.VariableOf(occurrence);
    have_symbols_.Add(symbol != kNoIndex);
    symbols_.push_back(symbol != kNoIndex ? symbol : 0);
    AddShown(symbol != kNoIndex ? bindings.texts[bindings.symbols[symbol].name] : Text(""), symbol_names_);
  }

  // A source may hold any bytes, a column of text only UTF-8.
  void AddShown(Text text, TextList& list) {
    shown_.clear();
    AppendShown(text, shown_);
    list.Add(shown_);
  }

  std::shared_ptr<const Dictionaries> dictionaries_;
  std::vector<int32_t> paths_;
  std::vector<uint32_t> indices_;
  std::vector<uint32_t> lines_;
  std::vector<uint32_t> columns_;
  std::vector<uint32_t> end_columns_;
  TextList texts_;
  std::vector<int8_t> roles_;
  std::vector<int8_t> kinds_;
  Bits have_kinds_;
  std::vector<Bits> flags_;
  std::vector<uint32_t> receivers_;
  Bits have_receivers_;
  Bits are_attributes_;
  std::vector<uint32_t> scopes_;
  TextList scope_names_;
  std::vector<uint32_t> symbols_;
  Bits have_symbols_;
  TextList symbol_names_;
  std::string shown_;
};

void FillTableArray(const std::shared_ptr<const ColumnTable>& table, ArrowArray* array) {
  const std::vector<ColumnBuffers> columns = table->Buffers();
  auto owned = std::make_unique<OwnedArray>();
  owned->buffers = {nullptr};  // no row is null
  owned->children.resize(columns.size());
  for (size_t i = 0; i < columns.size(); ++i) {
    auto column = std::make_unique<OwnedArray>();
    column->buffers = {columns[i].validity != nullptr ? columns[i].validity->data() : nullptr};
    Append(column->buffers, columns[i].values);
    column->keep = table;
    if (columns[i].dictionary != nullptr) {
      auto strings = std::make_unique<OwnedArray>();
      strings->buffers = {nullptr, columns[i].dictionary->offsets.data(), columns[i].dictionary->bytes.data()};
      strings->keep = table;
      column->dictionary = std::make_unique<ArrowArray>();
      FillArray(columns[i].dictionary->size(), std::move(strings), column->dictionary.get());
    }
    FillArray(table->size(), std::move(column), &owned->children[i]);
    if (columns[i].validity != nullptr)
      owned->children[i].null_count = static_cast<int64_t>(columns[i].validity->false_count());
  }
  FillArray(table->size(), std::move(owned), array);
}

// ---- the stream ----

struct Stream {
  std::unique_ptr<RecordSource> source;
  std::span<const Column> schema;
  std::function<std::shared_ptr<ColumnTable>()> make_table;
  std::string error;
};

Stream& StreamOf(ArrowArrayStream* stream) { return *static_cast<Stream*>(stream->private_data); }

// Runs `function`; an exception becomes the stream's error and its code.
template <class Function>
int Guarded(ArrowArrayStream* stream, Function&& function) {
  Stream& self = StreamOf(stream);
  try {
    function(self);
    return 0;
  } catch (const std::bad_alloc&) {
    self.error = "out of memory";
    return ENOMEM;
  } catch (const std::exception& error) {
    self.error = error.what();
    return EIO;
  } catch (...) {
    self.error = "unknown failure";
    return EIO;
  }
}

int GetSchema(ArrowArrayStream* stream, ArrowSchema* out) {
  return Guarded(stream, [out](Stream& self) { FillTableSchema(self.schema, out); });
}

int GetNext(ArrowArrayStream* stream, ArrowArray* out) {
  return Guarded(stream, [out](Stream& self) {
    const std::shared_ptr<ColumnTable> table = self.make_table();
    BatchResult result;
    while (table->size() < kBatchRows && self.source->Next(result)) {
      table->Add(result);
      result = {};
    }
    *out = {};
    if (table->size() != 0) FillTableArray(table, out);
  });
}

const char* GetLastError(ArrowArrayStream* stream) {
  const std::string& error = StreamOf(stream).error;
  return error.empty() ? nullptr : error.c_str();
}

void ReleaseStream(ArrowArrayStream* stream) {
  delete static_cast<Stream*>(stream->private_data);
  stream->release = nullptr;
}

template <class Table>
void Export(std::unique_ptr<RecordSource> source, ArrowArrayStream* stream) {
  auto state = std::make_unique<Stream>();
  state->schema = Table::kSchema;
  const auto dictionaries = std::make_shared<const Dictionaries>(source->inputs());
  state->make_table = [dictionaries] { return std::make_shared<Table>(dictionaries); };
  state->source = std::move(source);
  *stream = {GetSchema, GetNext, GetLastError, ReleaseStream, state.release()};
}

}  // namespace

void ExportRecordStream(std::unique_ptr<RecordSource> source, ArrowArrayStream* stream) {
  Export<RecordColumns>(std::move(source), stream);
}

void ExportOccurrenceStream(std::unique_ptr<RecordSource> source, ArrowArrayStream* stream) {
  Export<OccurrenceColumns>(std::move(source), stream);
}

}  // namespace quillet
