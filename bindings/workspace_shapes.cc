// Questions of a workspace about the shape of a file: folds, selections, colours and hints.
#include <string>
#include <utility>
#include <vector>

#include "bindings/workspace_rows.h"

namespace quillet::host {

namespace {

// Offsets at the beginnings of lines from 1, the last one behind its line; all of the file where they are 0.
std::pair<uint32_t, uint32_t> LinesOf(Workspace& workspace, FileId file, int first, int last) {
  if (first == 0 && last == 0) return {0, UINT32_MAX};
  return {workspace.OffsetOf(file, first, 1), workspace.OffsetOf(file, last, INT32_MAX) + 1};
}

nb::list FoldsOf(WorkspaceObject& self, nb::handle path) {
  const AskedPlace place(path, 1, 1);
  const std::vector<Fold> folds =
      self.Asked([&](Workspace& workspace) { return workspace.Folds(place.File(workspace)); });
  nb::list rows;
  for (const Fold& fold : folds) rows.append(nb::make_tuple(fold.first_line, fold.last_line, ShownText(fold.kind)));
  return rows;
}

nb::list SelectionsAt(WorkspaceObject& self, nb::handle path, int line, int column) {
  const AskedPlace place(path, line, column);
  const std::vector<PlacedRange> ranges = self.Asked([&](Workspace& workspace) {
    const FileId file = place.File(workspace);
    Placer placer(workspace);
    std::vector<PlacedRange> made;
    for (const Span& span : workspace.Selections(file, place.Offset(workspace)))
      made.push_back(placer.Range(file, span.begin, span.end));
    return made;
  });
  nb::list rows;
  for (const PlacedRange& range : ranges)
    rows.append(nb::make_tuple(range.begin.line, range.begin.col, range.end.line, range.end.col));
  return rows;
}

// Five numbers a name, as the protocol of editors has them: lines and columns since the name in front, length, kind,
// modifiers.
nb::list ColoursOf(WorkspaceObject& self, nb::handle path, int first, int last) {
  const AskedPlace place(path, 1, 1);
  const std::vector<int> numbers = self.Asked([&](Workspace& workspace) {
    const FileId file = place.File(workspace);
    const auto [begin, end] = LinesOf(workspace, file, first, last);
    std::vector<int> made;
    Position before{1, 1};
    for (const ColouredName& name : workspace.Colours(file, begin, end)) {
      const Position at = workspace.PlaceOf(file, name.begin);
      const Position behind = workspace.PlaceOf(file, name.end);
      made.insert(made.end(), {at.line - before.line, at.line == before.line ? at.col - before.col : at.col - 1,
                               behind.col - at.col, static_cast<int>(name.kind), name.modifiers});
      before = at;
    }
    return made;
  });
  nb::list list = nb::steal<nb::list>(PyList_New(static_cast<Py_ssize_t>(numbers.size())));
  for (size_t i = 0; i < numbers.size(); ++i)
    PyList_SET_ITEM(list.ptr(), static_cast<Py_ssize_t>(i), PyLong_FromLong(numbers[i]));
  return list;
}

nb::list HintsOf(WorkspaceObject& self, nb::handle path, int first, int last) {
  const AskedPlace place(path, 1, 1);
  const auto hints = self.Asked([&](Workspace& workspace) {
    const FileId file = place.File(workspace);
    const auto [begin, end] = LinesOf(workspace, file, first, last);
    std::vector<std::pair<InlineHint, Position>> made;
    for (InlineHint& hint : workspace.Hints(file, begin, end)) {
      const Position at = workspace.PlaceOf(file, hint.offset);
      made.emplace_back(std::move(hint), at);
    }
    return made;
  });
  nb::list rows;
  for (const auto& [hint, at] : hints)
    rows.append(nb::make_tuple(at.line, at.col, ShownText(hint.text), Word(hint.is_type ? "type" : "parameter"),
                               Word(WordOf(hint.certainty))));
  return rows;
}

nb::object TextOfFile(WorkspaceObject& self, nb::handle path) {
  const AskedPlace place(path, 1, 1);
  const std::string bytes =
      self.Asked([&](Workspace& workspace) { return std::string(workspace.SourceOf(place.File(workspace))); });
  return BytesOf(bytes);
}

}  // namespace

void BindShapes(nb::class_<WorkspaceObject>& workspace) {
  workspace.def("Folds", &FoldsOf, nb::arg("path"), "Rows (first line, last line, kind).")
      .def("Selections", &SelectionsAt, nb::arg("path"), nb::arg("line"), nb::arg("column"),
           "Rows (line, column, end line, end column), the smallest first.")
      .def("Colours", &ColoursOf, nb::arg("path"), nb::arg("first_line"), nb::arg("last_line"))
      .def("Hints", &HintsOf, nb::arg("path"), nb::arg("first_line"), nb::arg("last_line"),
           "Rows (line, column, text, kind, certainty).")
      .def("SourceOf", &TextOfFile, nb::arg("path"));
}

}  // namespace quillet::host
