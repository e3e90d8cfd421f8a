// Rows to columns. The number of rows is known in front; how much text there is, is not.
#include "analysis/record_table.h"

namespace quillet {

size_t RecordTable::ByteSize() const {
  return size() * (3 * sizeof(uint32_t) + 2 + 2 * sizeof(int64_t)) + names.capacity() + details.capacity();
}

void RecordTable::Fill(const FileAnalyzer& file, const ScopeNames& scope_source, PlacedRecords& placed) {
  const size_t count = file.store().rows.size() + file.store().arg_rows.size();
  lines.reserve(count);
  columns.reserve(count);
  scopes.reserve(count);
  kinds.reserve(count);
  is_parameter.reserve(count);
  name_offsets.reserve(count + 1);
  detail_offsets.reserve(count + 1);
  placed.Begin(file, scope_source);
  for (size_t row = 0; row < file.rows().size(); ++row) {
    for (const PlacedRecord& record : placed.OfRow(row)) {
      lines.push_back(record.line);
      columns.push_back(record.column);
      scopes.push_back(record.scope);
      kinds.push_back(record.kind);
      is_parameter.push_back(record.is_parameter);
      names.append(record.name);
      details.append(record.detail);
      name_offsets.push_back(static_cast<int64_t>(names.size()));
      detail_offsets.push_back(static_cast<int64_t>(details.size()));
    }
  }
  for (const Text name : scope_source.names()) scope_names.emplace_back(name);
  definitions.reserve(scope_source.scopes().size() - 1);
  for (const ScopeNames::Scope& scope : scope_source.scopes().subspan(1)) {
    const LineRow& head = file.rows()[scope.row];
    const Text own_name = scope.own_name;
    // A head without a name stands for it.
    const char* at =
        file.source().Holds(own_name.data()) ? own_name.data() : file.source().tokens[head.first_token].text;
    const Position position = file.source().PositionFrom(static_cast<int32_t>(head.first_line), at);
    definitions.push_back({scope.name, scope.kind, static_cast<uint32_t>(position.line) + 1,
                           static_cast<uint32_t>(position.col) + 1, head.first_line + 1, scope.last_line + 1});
  }
}

}  // namespace quillet
