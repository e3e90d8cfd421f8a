// Numbers and lists of numbers as they are in memory, each list behind its length. Whatever is an index in another
// list is looked at before anybody follows it.
#include "bindings/result_bytes.h"

#include <algorithm>
#include <cstring>
#include <memory>
#include <type_traits>

#include "foundations/errors.h"
#include "names/bindings.h"

namespace quillet::host {

namespace {

// Changes with what is written; the sizes tell builds apart that lay structures out differently.
constexpr uint32_t kResultFormat = 1;
constexpr uint32_t kResultLayout =
    kResultFormat << 24 | sizeof(Occurrence) << 16 | sizeof(NameScope) << 8 | sizeof(NameSymbol);

class Bytes {
 public:
  template <class Value>
  void operator()(const Value& value) requires std::is_trivially_copyable_v<Value> {
    out.append(reinterpret_cast<const char*>(&value), sizeof(value));
  }
  template <class Value>
  void operator()(const std::vector<Value>& values) requires std::is_trivially_copyable_v<Value> {
    (*this)(values.size());
    out.append(reinterpret_cast<const char*>(values.data()), values.size() * sizeof(Value));
  }
  void operator()(const std::string& text) {
    (*this)(text.size());
    out += text;
  }
  void operator()(const TextList& texts) {
    (*this)(texts.offsets);
    (*this)(texts.bytes);
  }
  void operator()(const std::vector<BatchResult::Message>& messages) {
    (*this)(messages.size());
    for (const BatchResult::Message& message : messages) {
      (*this)(message.line);
      (*this)(message.column);
      (*this)(message.text);
    }
  }

  std::string out;
};

class Reader {
 public:
  explicit Reader(Text bytes) : left_(bytes) {}

  template <class Value>
  void operator()(Value& value) requires std::is_trivially_copyable_v<Value> {
    std::memcpy(&value, Take(1, sizeof(value)), sizeof(value));
  }
  template <class Value>
  void operator()(std::vector<Value>& values) requires std::is_trivially_copyable_v<Value> {
    const size_t size = Size();
    const char* bytes = Take(size, sizeof(Value));
    values.resize(size);
    if (size != 0) std::memcpy(values.data(), bytes, size * sizeof(Value));
  }
  void operator()(std::string& text) {
    const size_t size = Size();
    text.assign(Take(size, 1), size);
  }
  void operator()(TextList& texts) {
    (*this)(texts.offsets);
    (*this)(texts.bytes);
    Check(!texts.offsets.empty() && texts.offsets.front() == 0 && std::ranges::is_sorted(texts.offsets) &&
          texts.offsets.back() == static_cast<int64_t>(texts.bytes.size()));
  }
  void operator()(std::vector<BatchResult::Message>& messages) {
    const size_t size = Size();
    for (size_t i = 0; i < size; ++i) {
      BatchResult::Message& message = messages.emplace_back();
      (*this)(message.line);
      (*this)(message.column);
      (*this)(message.text);
    }
  }

  bool is_at_end() const { return left_.empty(); }

  static void Check(bool holds) {
    if (!holds) ThrowError(ErrorKind::kValueError, "these are no bytes of a result of this build");
  }

 private:
  size_t Size() {
    size_t size;
    (*this)(size);
    return size;
  }
  const char* Take(size_t count, size_t width) {
    Check(count <= left_.size() / width);
    const char* at = left_.data();
    left_.remove_prefix(count * width);
    return at;
  }

  Text left_;
};

template <class Visit, class Table>
void VisitTable(Visit& visit, Table& table) {
  visit(table.lines);
  visit(table.columns);
  visit(table.scopes);
  visit(table.names);
  visit(table.details);
  visit(table.kinds);
  visit(table.is_parameter);
  visit(table.opens);
  visit(table.scope_texts);
  visit(table.name_texts);
  visit(table.detail_texts);
  visit(table.definitions);
}

template <class Visit, class Names>
void VisitBindings(Visit& visit, Names& bindings) {
  visit(bindings.occurrences);
  visit(bindings.scopes);
  visit(bindings.symbols);
  visit(bindings.texts);
  visit(bindings.line_starts);
  visit(bindings.is_python2);
}

template <class Visit, class Result>
void VisitResult(Visit& visit, Result& result) {
  visit(result.index);
  visit(result.problem);
  visit(result.byte_count);
  visit(result.line_count);
  visit(result.statement_count);
  visit(result.errors);
  visit(result.reports);
  visit(result.output);
  visit(result.bindings_size);
  VisitTable(visit, result.table);
}

void CheckTable(const RecordTable& table) {
  const size_t size = table.size();
  for (const auto* numbers : {&table.columns, &table.scopes, &table.names, &table.details})
    Reader::Check(numbers->size() == size);
  Reader::Check(table.kinds.size() == size && table.is_parameter.size() == size && table.opens.size() == size);
  const auto all_below = [](const std::vector<uint32_t>& numbers, size_t bound) {
    return std::ranges::all_of(numbers, [bound](uint32_t number) { return number < bound; });
  };
  Reader::Check(all_below(table.scopes, table.scope_texts.size()) && all_below(table.names, table.name_texts.size()) &&
                all_below(table.details, table.detail_texts.size()));
  for (const RecordKind kind : table.kinds) Reader::Check(static_cast<size_t>(kind) < RecordKindWords().size());
  for (const RecordTable::Definition& definition : table.definitions)
    Reader::Check(definition.scope < table.scope_texts.size());
}

void CheckBindings(const Bindings& bindings) {
  const size_t texts = bindings.texts.size();
  const size_t scopes = bindings.scopes.size();
  const size_t symbols = bindings.symbols.size();
  const auto is_index_or_none = [](uint32_t number, size_t bound) { return number == kNoIndex || number < bound; };
  Reader::Check(!bindings.line_starts.empty() && bindings.line_starts.front() == 0 &&
                std::ranges::is_sorted(bindings.line_starts));
  for (size_t i = 0; i < bindings.occurrences.size(); ++i) {
    const Occurrence& occurrence = bindings.occurrences[i];
    Reader::Check(occurrence.text < texts && occurrence.place < (occurrence.has_symbol ? symbols : scopes) &&
                  occurrence.receiver_distance <= i && static_cast<size_t>(occurrence.role) < NameRoleWords().size() &&
                  static_cast<size_t>(occurrence.kind) <= NameKindWords().size());
  }
  for (size_t i = 0; i < scopes; ++i) {
    const NameScope& scope = bindings.scopes[i];
    Reader::Check((i == 0 ? scope.parent == kNoIndex : scope.parent < i) && is_index_or_none(scope.name, texts) &&
                  is_index_or_none(scope.first_symbol, symbols) &&
                  static_cast<size_t>(scope.kind) < NameScopeKindWords().size());
  }
  for (size_t i = 0; i < symbols; ++i) {
    const NameSymbol& symbol = bindings.symbols[i];
    // Behind it, so that a chain has an end.
    Reader::Check(symbol.name < texts && symbol.scope < scopes && symbol.variable < symbols &&
                  (symbol.next == kNoIndex || (symbol.next > i && symbol.next < symbols)));
  }
}

}  // namespace

std::string BytesOfResult(const BatchResult& result) {
  Bytes bytes;
  bytes(kResultLayout);
  VisitResult(bytes, result);
  bytes(result.bindings != nullptr);
  if (result.bindings != nullptr) VisitBindings(bytes, *result.bindings);
  return std::move(bytes.out);
}

void ReadResult(Text bytes, BatchResult& result) {
  Reader reader(bytes);
  uint32_t layout;
  reader(layout);
  Reader::Check(layout == kResultLayout);
  VisitResult(reader, result);
  CheckTable(result.table);
  uint8_t has_bindings;
  reader(has_bindings);
  if (has_bindings != 0) {
    auto bindings = std::make_shared<Bindings>();
    VisitBindings(reader, *bindings);
    CheckBindings(*bindings);
    result.bindings = std::move(bindings);
  }
  Reader::Check(reader.is_at_end());
}

}  // namespace quillet::host
