// Columns grow at their end, and are cut off where a file failed half way.
#include "corpus/row_tables.h"

#include <algorithm>
#include <utility>

#include "foundations/errors.h"
#include "foundations/shown_text.h"

namespace quillet {

void TextColumn::Repeat(Text text, size_t count) {
  if (texts_ != nullptr) {
    numbers_.insert(numbers_.end(), count, texts_->NumberOf(text));
    return;
  }
  bytes_.reserve(bytes_.size() + text.size() * count);
  for (size_t i = 0; i < count; ++i) Add(text);
}

void TextColumn::Truncate(size_t size) {
  if (texts_ != nullptr) {
    numbers_.resize(size);
    if (size != 0) return;
    word_numbers_.clear();
    return texts_->Clear();
  }
  offsets_.resize(size + 1);
  bytes_.resize(static_cast<size_t>(offsets_.back()));
}

// ---- carried columns ----

CarriedColumn::CarriedColumn(std::string name, const InputColumn& input, bool must_be_text)
    : form_(input.form()), schema_{std::move(name), {}, {}, true}, width_(input.width()) {
  const bool is_text = form_ == InputColumn::Form::kText || form_ == InputColumn::Form::kBytes;
  if (must_be_text && !is_text && form_ != InputColumn::Form::kNull)
    ThrowError(ErrorKind::kTypeError, "column '" + schema_.name + "' must hold strings or bytes");
  // Of nothing but nulls nobody knows what they would be.
  if (must_be_text || form_ == InputColumn::Form::kNull) form_ = InputColumn::Form::kText;
  switch (form_) {
    case InputColumn::Form::kText:
      schema_.format = "u";
      break;
    case InputColumn::Form::kBytes:
      schema_.format = "z";
      break;
    case InputColumn::Form::kFixed:
      schema_.format = input.format();
      break;
    case InputColumn::Form::kBits:
      schema_.format = "b";
      break;
    case InputColumn::Form::kNull:
      break;
  }
}

void CarriedColumn::Repeat(const InputColumn& input, size_t row, size_t count) {
  const bool is_null = input.IsNull(row);
  size_ += count;
  validity_.Add(!is_null, count);
  switch (form_) {
    case InputColumn::Form::kText:
    case InputColumn::Form::kBytes: {
      const Text text = is_null ? Text() : input.At(row);
      if (form_ == InputColumn::Form::kText && input.form() == InputColumn::Form::kBytes) {
        std::string shown;
        AppendShown(text, shown);
        texts_.Repeat(shown, count);
      } else {
        texts_.Repeat(text, count);
      }
      break;
    }
    case InputColumn::Form::kFixed: {
      const std::string value = is_null ? std::string(width_, '\0') : std::string(input.At(row));
      for (size_t i = 0; i < count; ++i) fixed_ += value;
      break;
    }
    case InputColumn::Form::kBits: {
      const bool value = !is_null && input.BitAt(row);
      for (size_t i = 0; i < count; ++i) bits_.Add(value);
      break;
    }
    case InputColumn::Form::kNull:
      break;
  }
}

void CarriedColumn::Truncate(size_t size) {
  size_ = size;
  validity_.Truncate(size);
  switch (form_) {
    case InputColumn::Form::kText:
    case InputColumn::Form::kBytes:
      return texts_.Truncate(size);
    case InputColumn::Form::kFixed:
      return fixed_.resize(size * width_);
    case InputColumn::Form::kBits:
      return bits_.Truncate(size);
    case InputColumn::Form::kNull:
      break;
  }
}

ColumnBuffers CarriedColumn::Buffers() const {
  const Bits* validity = validity_.false_count() != 0 ? &validity_ : nullptr;
  switch (form_) {
    case InputColumn::Form::kText:
    case InputColumn::Form::kBytes:
      return texts_.Buffers(validity);
    case InputColumn::Form::kFixed:
      return {{fixed_.data()}, {}, validity};
    case InputColumn::Form::kBits:
      return {{bits_.data()}, {}, validity};
    case InputColumn::Form::kNull:
      break;
  }
  return {};
}

// ---- tables ----

RowTable::RowTable(std::vector<CarriedColumn> carried, TextForm text_form, size_t most_rows)
    : text_form_(text_form), most_rows_(most_rows), carried_(std::move(carried)) {
  for (CarriedColumn& column : carried_) column.SetTextForm(text_form, room());
}

void RowTable::Carry(const InputRow& input) {
  ForgetSource();
  const size_t count = size() - carried_rows_;
  if (count == 0) return;
  for (size_t i = 0; i < carried_.size(); ++i) carried_[i].Repeat((*input.columns)[i], input.row, count);
  carried_rows_ = size();
}

void RowTable::Truncate(size_t size) {
  ForgetSource();
  TruncateOwn(size);
  if (carried_rows_ <= size) return;
  for (CarriedColumn& column : carried_) column.Truncate(size);
  carried_rows_ = size;
}

size_t RowTable::byte_size() const {
  size_t bytes = own_byte_size();
  for (const CarriedColumn& column : carried_) bytes += column.byte_size();
  return bytes;
}

std::vector<Column> RowTable::Schema() const {
  std::vector<Column> columns;
  for (const CarriedColumn& column : carried_) columns.push_back(column.schema());
  for (Column& column : OwnSchema()) {
    const auto has_its_name = [&column](const CarriedColumn& other) { return other.schema().name == column.name; };
    if (std::any_of(carried_.begin(), carried_.end(), has_its_name))
      ThrowError(ErrorKind::kValueError, "column '" + column.name + "' cannot be kept: there is one of that name");
    columns.push_back(std::move(column));
  }
  return columns;
}

std::vector<ColumnBuffers> RowTable::Buffers() const {
  std::vector<ColumnBuffers> buffers;
  for (const CarriedColumn& column : carried_) buffers.push_back(column.Buffers());
  for (ColumnBuffers& column : OwnBuffers()) buffers.push_back(std::move(column));
  return buffers;
}

namespace {

// Texts that most rows lack.
class RareTexts {
 public:
  RareTexts(TextForm form, size_t rows) : texts_(form, rows) {}

  void Add(Text text) {
    texts_.Add(text);
    are_there_.Add(true);
  }
  void AddNone(size_t count = 1) {
    texts_.AddNone(count);
    are_there_.Add(false, count);
  }
  void Truncate(size_t size) {
    texts_.Truncate(size);
    are_there_.Truncate(size);
  }
  size_t byte_size() const { return texts_.byte_size(); }
  ColumnBuffers Buffers() const { return texts_.Buffers(are_there_.false_count() != 0 ? &are_there_ : nullptr); }

 private:
  TextColumn texts_;
  Bits are_there_;
};

// ---- records ----

class RecordRows : public RowTable {
 public:
  RecordRows(std::vector<CarriedColumn> carried, TextForm text_form, size_t most_rows)
      : RowTable(std::move(carried), text_form, most_rows) {
    lines_.reserve(room());
    columns_.reserve(room());
  }

  size_t size() const override { return lines_.size(); }

  void AddRecords(std::span<const PlacedRecord> records, std::span<const Text> scopes) override {
    if (names_.has_numbers())
      AddNumbers(records, scopes);
    else
      AddTexts(records, scopes);
    const size_t count = records.size();
    int32_t* const lines = AddTo(lines_, count);
    int32_t* const columns = AddTo(columns_, count);
    for (size_t i = 0; i < count; ++i) {
      lines[i] = static_cast<int32_t>(records[i].line);
      columns[i] = static_cast<int32_t>(records[i].column);
    }
    are_parameters_.AddEach(count, [records](size_t i) { return records[i].is_parameter; });
    errors_.AddNone(count);
  }

  void AddMessage(Text kind, const BatchResult::Message& message) override {
    lines_.push_back(static_cast<int32_t>(message.line));
    columns_.push_back(static_cast<int32_t>(message.column));
    scopes_.Add({});
    names_.Add({});
    kinds_.Add(kind);
    details_.Add({});
    are_parameters_.Add(false);
    errors_.Add(message.text);
  }

 protected:
  std::vector<Column> OwnSchema() const override {
    return {{"line", "i", {}}, {"column", "i", {}}, {"scope", "u", {}},        {"name", "u", {}},
            {"kind", "u", {}}, {"detail", "u", {}}, {"is_parameter", "b", {}}, {"error", "u", {}, true}};
  }
  std::vector<ColumnBuffers> OwnBuffers() const override {
    return {
        {{lines_.data()}}, {{columns_.data()}}, scopes_.Buffers(),          names_.Buffers(),
        kinds_.Buffers(),  details_.Buffers(),  {{are_parameters_.data()}}, errors_.Buffers(),
    };
  }
  size_t own_byte_size() const override {
    return scopes_.byte_size() + names_.byte_size() + kinds_.byte_size() + details_.byte_size() + errors_.byte_size();
  }
  void TruncateOwn(size_t size) override {
    lines_.resize(size);
    columns_.resize(size);
    for (TextColumn* texts : {&scopes_, &names_, &kinds_, &details_}) texts->Truncate(size);
    are_parameters_.Truncate(size);
    errors_.Truncate(size);
  }
  void ForgetSource() override { scope_numbers_.clear(); }

 private:
  void AddTexts(std::span<const PlacedRecord> records, std::span<const Text> scopes) {
    for (const PlacedRecord& record : records) {
      scopes_.Add(scopes[record.scope]);
      names_.Add(record.name);
      kinds_.Add(RecordKindWords()[static_cast<size_t>(record.kind)]);
      details_.Add(record.detail);
    }
  }
  // The tables of a run's texts are larger than caches are: what is asked of them is fetched for all records first.
  void AddNumbers(std::span<const PlacedRecord> records, std::span<const Text> scopes) {
    ColumnTexts& names = names_.texts();
    ColumnTexts& details = details_.texts();
    asked_.clear();
    for (const PlacedRecord& record : records) {
      const auto& [name, detail] =
          asked_.emplace_back(ColumnTexts::Asked(record.name), ColumnTexts::Asked(record.detail));
      names.FetchSlot(name);
      details.FetchSlot(detail);
    }
    for (const auto& [name, detail] : asked_) {
      names.FetchText(name);
      details.FetchText(detail);
    }
    const size_t count = records.size();
    uint32_t* const numbers_of_names = names_.AddNumbers(count);
    uint32_t* const numbers_of_details = details_.AddNumbers(count);
    for (size_t i = 0; i < count; ++i) {
      numbers_of_names[i] = names.NumberOf(asked_[i].first);
      numbers_of_details[i] = details.NumberOf(asked_[i].second);
    }
    uint32_t* const numbers_of_scopes = scopes_.AddNumbers(count);
    uint32_t* const numbers_of_kinds = kinds_.AddNumbers(count);
    const std::span<const uint32_t> kinds = kinds_.NumbersOf(RecordKindWords());
    for (size_t i = 0; i < count; ++i) {
      numbers_of_scopes[i] = NumberOfScope(records[i].scope, scopes);
      numbers_of_kinds[i] = kinds[static_cast<size_t>(records[i].kind)];
    }
  }
  uint32_t NumberOfScope(uint32_t index, std::span<const Text> scopes) {
    if (index >= scope_numbers_.size()) scope_numbers_.resize(scopes.size(), kNoIndex);
    uint32_t& number = scope_numbers_[index];
    if (number == kNoIndex) number = scopes_.texts().NumberOf(scopes[index]);
    return number;
  }

  std::vector<int32_t> lines_;
  std::vector<int32_t> columns_;
  TextColumn scopes_{text_form(), room()};
  std::vector<uint32_t> scope_numbers_;  // of a source's scopes
  TextColumn names_{text_form(), room()};
  TextColumn kinds_{text_form(), room()};
  TextColumn details_{text_form(), room()};
  Bits are_parameters_;
  RareTexts errors_{text_form(), room()};
  // Names and details of the records that are being added.
  std::vector<std::pair<ColumnTexts::Asked, ColumnTexts::Asked>> asked_;
};

// ---- occurrences ----

class OccurrenceRows : public RowTable {
 public:
  using RowTable::RowTable;

  size_t size() const override { return indices_.size(); }

  void AddOccurrence(const Bindings& bindings, uint32_t index, const std::vector<std::string>& scope_names) override {
    const Occurrence& occurrence = bindings.occurrences[index];
    const Position place = bindings.PositionOf(occurrence.begin);
    const auto column = static_cast<int32_t>(place.col) + 1;
    AddPlace(static_cast<int32_t>(index), static_cast<int32_t>(place.line) + 1, column,
             column + static_cast<int32_t>(bindings.TextOf(occurrence).size()));
    AddShown(bindings.TextOf(occurrence), texts_);
    roles_.Add(NameRoleWords()[static_cast<size_t>(occurrence.role)]);
    if (occurrence.binds())
      kinds_.Add(NameKindWords()[static_cast<size_t>(occurrence.kind) - 1]);
    else
      kinds_.AddNone();
    for (size_t bit = 0; bit < flags_.size(); ++bit) flags_[bit].Add((occurrence.flags >> bit & 1) != 0);
    AddNumber(bindings.ReceiverOf(index), receivers_, have_receivers_);
    are_attributes_.Add(occurrence.is_attribute);
    const uint32_t scope = bindings.ScopeOf(occurrence);
    scopes_.push_back(static_cast<int32_t>(scope));
    scope_names_.Add(scope_names[scope]);
    const uint32_t symbol = bindings.VariableOf(occurrence);
    AddNumber(symbol, symbols_, have_symbols_);
    AddShown(symbol != kNoIndex ? bindings.texts[bindings.symbols[symbol].name] : Text(), symbol_names_);
    errors_.AddNone();
  }

  void AddMessage(Text kind, const BatchResult::Message& message) override {
    const auto column = static_cast<int32_t>(message.column);
    AddPlace(-1, static_cast<int32_t>(message.line), column, column);
    texts_.Add({});
    roles_.Add(kind);
    kinds_.AddNone();
    for (Bits& flag : flags_) flag.Add(false);
    AddNumber(kNoIndex, receivers_, have_receivers_);
    are_attributes_.Add(false);
    scopes_.push_back(0);
    scope_names_.Add({});
    AddNumber(kNoIndex, symbols_, have_symbols_);
    symbol_names_.Add({});
    errors_.Add(message.text);
  }

 protected:
  std::vector<Column> OwnSchema() const override {
    return {
        {"index", "i", {}},          {"line", "i", {}},         {"column", "i", {}},
        {"end_column", "i", {}},     {"text", "u", {}},         {"role", "u", {}},
        {"kind", "u", {}, true},
#define QUILLET_NAME_FLAG(identifier, number, word) {word, "b", {}},
#include "names/words.def"
        {"receiver", "i", {}, true}, {"is_attribute", "b", {}}, {"scope", "i", {}},
        {"scope_name", "u", {}},     {"symbol", "i", {}, true}, {"symbol_name", "u", {}, true},
        {"error", "u", {}, true},
    };
  }
  std::vector<ColumnBuffers> OwnBuffers() const override {
    std::vector<ColumnBuffers> buffers = {
        {{indices_.data()}}, {{lines_.data()}}, {{columns_.data()}}, {{end_columns_.data()}},
        texts_.Buffers(),    roles_.Buffers(),  kinds_.Buffers(),
    };
    for (const Bits& flag : flags_) buffers.push_back({{flag.data()}});
    buffers.push_back({{receivers_.data()}, {}, &have_receivers_});
    buffers.push_back({{are_attributes_.data()}});
    buffers.push_back({{scopes_.data()}});
    buffers.push_back(scope_names_.Buffers());
    buffers.push_back({{symbols_.data()}, {}, &have_symbols_});
    buffers.push_back(symbol_names_.Buffers(&have_symbols_));
    buffers.push_back(errors_.Buffers());
    return buffers;
  }
  size_t own_byte_size() const override {
    return texts_.byte_size() + roles_.byte_size() + kinds_.byte_size() + scope_names_.byte_size() +
           symbol_names_.byte_size() + errors_.byte_size();
  }
  void TruncateOwn(size_t size) override {
    for (auto* numbers : {&indices_, &lines_, &columns_, &end_columns_, &receivers_, &scopes_, &symbols_})
      numbers->resize(size);
    for (TextColumn* texts : {&texts_, &roles_, &scope_names_, &symbol_names_}) texts->Truncate(size);
    for (Bits& flag : flags_) flag.Truncate(size);
    for (Bits* bits : {&have_receivers_, &are_attributes_, &have_symbols_}) bits->Truncate(size);
    kinds_.Truncate(size);
    errors_.Truncate(size);
  }

 private:
  void AddPlace(int32_t index, int32_t line, int32_t column, int32_t end_column) {
    indices_.push_back(index);
    lines_.push_back(line);
    columns_.push_back(column);
    end_columns_.push_back(end_column);
  }
  static void AddNumber(uint32_t number, std::vector<int32_t>& numbers, Bits& are_there) {
    are_there.Add(number != kNoIndex);
    numbers.push_back(number != kNoIndex ? static_cast<int32_t>(number) : 0);
  }
  // A source may hold any bytes, a column of text only UTF-8.
  void AddShown(Text text, TextColumn& texts) {
    shown_.clear();
    AppendShown(text, shown_);
    texts.Add(shown_);
  }

  std::vector<int32_t> indices_;
  std::vector<int32_t> lines_;
  std::vector<int32_t> columns_;
  std::vector<int32_t> end_columns_;
  TextColumn texts_{text_form(), room()};
  TextColumn roles_{text_form(), room()};
  RareTexts kinds_{text_form(), room()};
  std::vector<Bits> flags_ = std::vector<Bits>(NameFlagWords().size());
  std::vector<int32_t> receivers_;
  Bits have_receivers_;
  Bits are_attributes_;
  std::vector<int32_t> scopes_;
  TextColumn scope_names_{text_form(), room()};
  std::vector<int32_t> symbols_;
  Bits have_symbols_;
  TextColumn symbol_names_{text_form(), room()};
  RareTexts errors_{text_form(), room()};
  std::string shown_;
};

// ---- files ----

class FileRows : public RowTable {
 public:
  using RowTable::RowTable;

  size_t size() const override { return bytes_.size(); }

  void AddFile(const BatchResult& result, Text python) override {
    pythons_.Add(python);
    bytes_.push_back(static_cast<int64_t>(result.byte_count));
    lines_.push_back(static_cast<int64_t>(result.line_count));
    statements_.push_back(static_cast<int64_t>(result.statement_count));
    errors_.push_back(static_cast<int64_t>(result.errors.size()));
    if (result.problem.empty())
      problems_.AddNone();
    else
      problems_.Add(result.problem);
  }

 protected:
  std::vector<Column> OwnSchema() const override {
    return {{"python", "u", {}},     {"bytes", "l", {}},  {"lines", "l", {}},
            {"statements", "l", {}}, {"errors", "l", {}}, {"problem", "u", {}, true}};
  }
  std::vector<ColumnBuffers> OwnBuffers() const override {
    return {pythons_.Buffers(),     {{bytes_.data()}},  {{lines_.data()}},
            {{statements_.data()}}, {{errors_.data()}}, problems_.Buffers()};
  }
  size_t own_byte_size() const override { return pythons_.byte_size() + problems_.byte_size(); }
  void TruncateOwn(size_t size) override {
    for (auto* numbers : {&bytes_, &lines_, &statements_, &errors_}) numbers->resize(size);
    pythons_.Truncate(size);
    problems_.Truncate(size);
  }

 private:
  TextColumn pythons_{text_form(), room()};
  std::vector<int64_t> bytes_;
  std::vector<int64_t> lines_;
  std::vector<int64_t> statements_;
  std::vector<int64_t> errors_;
  RareTexts problems_{text_form(), room()};
};

}  // namespace

std::shared_ptr<RowTable> MakeRowTable(RowForm form, std::vector<CarriedColumn> carried, size_t numbered_rows) {
  const TextForm texts = numbered_rows != 0 ? TextForm::kNumbered : TextForm::kPlain;
  const size_t most_rows = numbered_rows != 0 ? numbered_rows : RowTable::kMostRows;
  switch (form) {
    case RowForm::kRecords:
      return std::make_shared<RecordRows>(std::move(carried), texts, most_rows);
    case RowForm::kOccurrences:
      return std::make_shared<OccurrenceRows>(std::move(carried), texts, most_rows);
    case RowForm::kFiles:
      break;
  }
  return std::make_shared<FileRows>(std::move(carried), texts, most_rows);
}

}  // namespace quillet
