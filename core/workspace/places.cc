// Lines and columns in the units that the asker counts in.
#include <algorithm>

#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

constexpr uint32_t kByteOrderMarkSize = 3;

}  // namespace

void Workspace::set_column_unit(ColumnUnit unit) {
  impl_->column_unit = unit;
  impl_->ForgetPlaces();
}

std::pair<uint32_t, uint32_t> Workspace::Impl::LineAt(const SourceFile& file, int line) {
  const std::vector<uint32_t>& starts = file.bindings.line_starts;
  const auto size = static_cast<uint32_t>(file.text().size());
  if (line < 1 || starts.empty()) return {0, 0};
  if (static_cast<size_t>(line) > starts.size()) return {size, size};
  uint32_t begin = starts[static_cast<size_t>(line) - 1];
  uint32_t end = static_cast<size_t>(line) < starts.size() ? starts[static_cast<size_t>(line)] : size;
  while (end > begin && (file.text()[end - 1] == '\n' || file.text()[end - 1] == '\r')) --end;
  if (line == 1 && begin == kByteOrderMarkSize && column_unit != ColumnUnit::kUtf8 && files.IsOpen(file.id)) begin = 0;
  return {begin, end};
}

// The source is read once for all places of a file that is not held.
Text Workspace::Impl::SourceForPlaces(FileId id) {
  if (files.IsHeld(id)) return Get(id)->text();
  if (placed_source_of != id) {
    const Text source = files.SourceOf(id, placed_source);
    if (source.data() != placed_source.data()) placed_source = source;
    placed_source_of = id;
  }
  return placed_source;
}

Position Workspace::PlaceOf(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  const Position place = in.files.PlaceOf(id, offset);
  if (in.column_unit == ColumnUnit::kUtf8) return place;
  const Text source = in.SourceForPlaces(id);
  offset = std::min(offset, static_cast<uint32_t>(source.size()));
  uint32_t begin = offset - std::min(offset, static_cast<uint32_t>(place.col - 1));
  if (place.line == 1 && begin == kByteOrderMarkSize && in.files.IsOpen(id)) begin = 0;
  Impl::Placed& last = in.placed;
  if (last.file != id || last.place.line != place.line || last.offset > offset) last = {id, begin, {place.line, 1}};
  last.place.col += static_cast<int>(UnitsOf(source.substr(last.offset, offset - last.offset), in.column_unit));
  last.offset = offset;
  return last.place;
}

uint32_t Workspace::OffsetOf(FileId id, int line, int column) {
  const SourceFile* file = impl_->Get(id);
  if (file == nullptr) return 0;
  if (impl_->column_unit == ColumnUnit::kUtf8) return file->OffsetOf(line, column);
  const auto [begin, end] = impl_->LineAt(*file, line);
  const auto units = static_cast<size_t>(std::max(column, 1)) - 1;
  return begin +
         static_cast<uint32_t>(BytesOfUnits(file->text().substr(begin, end - begin), units, impl_->column_unit));
}

}  // namespace quillet
