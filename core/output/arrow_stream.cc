// Results are gathered into tables of columns until one makes a batch.
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
#include "output/arrow_export.h"

namespace quillet {

namespace {

// Rows that make a batch worth while.
constexpr size_t kBatchRows = size_t{1} << 16;

// ---- the schema ----

constexpr const char* kTexts = "U";  // of all dictionaries

std::span<const Column> RecordSchema() {
  static const auto& columns = *new std::vector<Column>{
      {"path", "i", kTexts}, {"line", "I", {}},     {"column", "I", {}}, {"scope", "U", {}},
      {"name", "U", {}},     {"kind", "c", kTexts}, {"detail", "U", {}}, {"is_parameter", "b", {}},
  };
  return columns;
}

std::span<const Column> OccurrenceSchema() {
  static const auto& columns = *new std::vector<Column>{
      {"path", "i", kTexts},       {"index", "I", {}},          {"line", "I", {}},
      {"column", "I", {}},         {"end_column", "I", {}},     {"text", "U", {}},
      {"role", "c", kTexts},       {"kind", "c", kTexts, true},
#define QUILLET_NAME_FLAG(identifier, number, word) {word, "b", {}},
#include "names/words.def"
      {"receiver", "I", {}, true}, {"is_attribute", "b", {}},   {"scope", "I", {}},
      {"scope_name", "U", {}},     {"symbol", "I", {}, true},   {"symbol_name", "U", {}, true},
  };
  return columns;
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

// The rows of several files as columns.
class ResultTable : public ColumnTable {
 public:
  virtual void Add(const BatchResult& result) = 0;
};

template <class To, class From>
void Append(To& to, const From& from) {
  to.insert(to.end(), from.begin(), from.end());
}

class RecordColumns : public ResultTable {
 public:
  static std::span<const Column> Schema() { return RecordSchema(); }

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
        {{paths_.data()}, ColumnBuffers::DictionaryOf(dictionaries_->paths)},
        {{lines_.data()}},
        {{columns_.data()}},
        ColumnBuffers::Of(scopes_),
        ColumnBuffers::Of(names_),
        {{kinds_.data()}, ColumnBuffers::DictionaryOf(dictionaries_->record_kinds)},
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

class OccurrenceColumns : public ResultTable {
 public:
  static std::span<const Column> Schema() { return OccurrenceSchema(); }

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
        {{paths_.data()}, ColumnBuffers::DictionaryOf(dictionaries_->paths)},
        {{indices_.data()}},
        {{lines_.data()}},
        {{columns_.data()}},
        {{end_columns_.data()}},
        ColumnBuffers::Of(texts_),
        {{roles_.data()}, ColumnBuffers::DictionaryOf(dictionaries_->roles)},
        {{kinds_.data()}, ColumnBuffers::DictionaryOf(dictionaries_->name_kinds), &have_kinds_},
    };
    for (const Bits& flag : flags_) buffers.push_back({{flag.data()}});
    Append(buffers, std::vector<ColumnBuffers>{
                        {{receivers_.data()}, {}, &have_receivers_},
                        {{are_attributes_.data()}},
                        {{scopes_.data()}},
                        ColumnBuffers::Of(scope_names_),
                        {{symbols_.data()}, {}, &have_symbols_},
                        ColumnBuffers::Of(symbol_names_, &have_symbols_),
                    });
    return buffers;
  }

 private:
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
    have_kinds_.Add(occurrence.binds());
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

// ---- the stream ----

struct Stream {
  std::unique_ptr<RecordSource> source;
  std::span<const Column> schema;
  std::function<std::shared_ptr<ResultTable>()> make_table;
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
    const std::shared_ptr<ResultTable> table = self.make_table();
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
  state->schema = Table::Schema();
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
