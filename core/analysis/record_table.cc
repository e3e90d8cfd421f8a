// Rows to columns. The number of rows is known in front; how much text there is, is not.
#include "analysis/record_table.h"

namespace quillet {

namespace {

size_t ByteSizeOf(const TextList& texts) { return texts.bytes.capacity() + texts.size() * sizeof(int64_t); }

RecordTable::Opens OpensOf(ScopeNames::ScopeKind kind) {
  switch (kind) {
    case ScopeNames::ScopeKind::kClass:
      return RecordTable::Opens::kClass;
    case ScopeNames::ScopeKind::kFunction:
      return RecordTable::Opens::kFunction;
    case ScopeNames::ScopeKind::kModule:
    case ScopeNames::ScopeKind::kTypeAlias:
      break;
  }
  return RecordTable::Opens::kNothing;
}

uint64_t PlaceKey(uint32_t line, uint32_t column) { return uint64_t{line} << 32 | column; }

}  // namespace

size_t RecordTable::ByteSize() const {
  return size() * (5 * sizeof(uint32_t) + 3) + ByteSizeOf(scope_texts) + ByteSizeOf(name_texts) +
         ByteSizeOf(detail_texts);
}

RecordTable RecordTableMaker::Make(const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed) {
  RecordTable table;
  const size_t count = file.store().rows.size() + file.store().arg_rows.size();
  table.lines.reserve(count);
  table.columns.reserve(count);
  table.scopes.reserve(count);
  table.names.reserve(count);
  table.details.reserve(count);
  table.kinds.reserve(count);
  table.is_parameter.reserve(count);
  // Those of the file before view what is gone. Most texts come more than once.
  names_.Begin(count / 3);
  details_.Begin(count / 3);
  placed.Begin(file, scopes);
  for (size_t row = 0; row < file.rows().size(); ++row) {
    file.CheckMemory(table.ByteSize());
    for (const PlacedRecord& record : placed.OfRow(row)) {
      table.lines.push_back(record.line);
      table.columns.push_back(record.column);
      table.scopes.push_back(record.scope);
      table.names.push_back(NumberOf(record.name, names_, table.name_texts));
      table.details.push_back(NumberOf(record.detail, details_, table.detail_texts));
      table.kinds.push_back(record.kind);
      table.is_parameter.push_back(record.is_parameter);
    }
  }
  for (const Text name : scopes.names()) table.scope_texts.Add(name);
  AddDefinitions(file, scopes, table);
  SetOpens(table);
  return table;
}

uint32_t RecordTableMaker::NumberOf(Text text, TextNumbers& numbers, TextList& texts) {
  const uint32_t number = numbers.NumberOf(text);
  if (number == texts.size()) texts.Add(text);
  return number;
}

void RecordTableMaker::AddDefinitions(const FileAnalyzer& file, const ScopeNames& scopes, RecordTable& table) {
  table.definitions.reserve(scopes.scopes().size() - 1);
  for (const ScopeNames::Scope& scope : scopes.scopes().subspan(1)) {
    const LineRow& head = file.rows()[scope.row];
    const Text own_name = scope.own_name;
    // A head without a name stands for it.
    const char* at =
        file.source().Holds(own_name.data()) ? own_name.data() : file.source().tokens[head.first_token].text;
    const Position position = file.source().PositionFrom(static_cast<int32_t>(head.first_line), at);
    table.definitions.push_back({scope.name, scope.kind, static_cast<uint32_t>(position.line) + 1,
                                 static_cast<uint32_t>(position.col) + 1, head.first_line + 1, scope.last_line + 1});
  }
}

void RecordTableMaker::SetOpens(RecordTable& table) {
  opens_.clear();
  for (const RecordTable::Definition& definition : table.definitions)
    opens_[PlaceKey(definition.line, definition.column)] = OpensOf(definition.kind);
  table.opens.assign(table.size(), RecordTable::Opens::kNothing);
  for (size_t i = 0; i < table.size(); ++i) {
    if (table.kinds[i] != RecordKind::kSet) continue;
    if (const auto found = opens_.find(PlaceKey(table.lines[i], table.columns[i])); found != opens_.end())
      table.opens[i] = found->second;
  }
}

}  // namespace quillet
