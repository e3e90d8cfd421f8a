// What the questions of a workspace share: places as they are asked, and answers as plain tuples.
#pragma once

#include <optional>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/rows.h"
#include "bindings/workspace_object.h"

namespace quillet::host {

// ---- rows, made without the interpreter lock ----

// A range of a file, by lines and columns from 1.
struct PlacedRange {
  FileId file = kNoFile;
  Position begin{1, 1};
  Position end{1, 1};
};

struct PlacedLocation {
  PlacedRange range;
  Text role;
  Text kind;
  Certainty certainty;
};

// Turns offsets into places, and remembers the paths of the files they are in.
class Placer {
 public:
  explicit Placer(Workspace& workspace) : workspace_(workspace) {}

  PlacedRange Range(FileId file, uint32_t begin, uint32_t end) {
    if (file == kNoFile) return {};
    if (!paths_.contains(file)) paths_.emplace(file, workspace_.PathOf(file));
    return {file, workspace_.PlaceOf(file, begin), workspace_.PlaceOf(file, end)};
  }
  PlacedLocation Of(const Location& location) {
    return {Range(location.file, location.begin, location.end), location.role, location.kind, location.certainty};
  }
  std::vector<PlacedLocation> All(const std::vector<Location>& locations) {
    std::vector<PlacedLocation> placed;
    placed.reserve(locations.size());
    for (const Location& location : locations) placed.push_back(Of(location));
    return placed;
  }

  std::unordered_map<FileId, std::string> TakePaths() { return std::move(paths_); }

 private:
  Workspace& workspace_;
  std::unordered_map<FileId, std::string> paths_;
};

// ---- rows of the host ----

inline nb::object Word(Text word) { return word.empty() ? nb::object(nb::none()) : Checked(ShownText(word)); }

class Rows {
 public:
  explicit Rows(std::unordered_map<FileId, std::string> paths) : paths_(std::move(paths)) {}

  const nb::object& Path(FileId file) {
    nb::object& shown = shown_[file];
    if (!shown.is_valid()) {
      const std::string& path = paths_[file];
      shown = Checked(nb::steal(PyUnicode_DecodeFSDefaultAndSize(path.data(), static_cast<Py_ssize_t>(path.size()))));
    }
    return shown;
  }
  nb::tuple LocationRow(const PlacedLocation& at) {
    return nb::make_tuple(Path(at.range.file), at.range.begin.line, at.range.begin.col, at.range.end.col, Word(at.role),
                          Word(at.kind), Word(WordOf(at.certainty)));
  }
  nb::list LocationRows(const std::vector<PlacedLocation>& locations) {
    nb::list rows;
    for (const PlacedLocation& location : locations) rows.append(LocationRow(location));
    return rows;
  }

 private:
  std::unordered_map<FileId, std::string> paths_;
  std::unordered_map<FileId, nb::object> shown_;
};

// ---- places ----

// Where a question is asked.
struct AskedPlace {
  HostText path;
  int line = 1;
  int column = 1;

  AskedPlace(nb::handle host_path, int given_line, int given_column)
      : path(HostText::FromBytes(host_path)), line(given_line), column(given_column) {}
  FileId File(Workspace& workspace) const { return workspace.FileOf(path.text()); }
  uint32_t Offset(Workspace& workspace) const { return workspace.OffsetOf(File(workspace), line, column); }
};

}  // namespace quillet::host
