// The questions of a workspace: places in, plain tuples out, which the package gives names.
#include <algorithm>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "bindings/workspace_rows.h"

namespace quillet::host {

namespace {

// A question that is answered by locations.
using LocationQuestion = std::vector<Location> (Workspace::*)(FileId, uint32_t);

template <class Ask>
nb::list AskLocations(WorkspaceObject& self, Ask&& ask) {
  auto [placed, paths] = self.Asked([&](Workspace& workspace) {
    Placer placer(workspace);
    std::vector<PlacedLocation> all = placer.All(ask(workspace));
    return std::pair(std::move(all), placer.TakePaths());
  });
  return Rows(std::move(paths)).LocationRows(placed);
}

template <LocationQuestion kQuestion>
nb::list LocationsAt(WorkspaceObject& self, nb::handle path, int line, int column) {
  const AskedPlace place(path, line, column);
  return AskLocations(self, [&](Workspace& workspace) {
    return (workspace.*kQuestion)(place.File(workspace), place.Offset(workspace));
  });
}

nb::list ReferencesAt(WorkspaceObject& self, nb::handle path, int line, int column, bool everywhere) {
  const AskedPlace place(path, line, column);
  return AskLocations(self, [&](Workspace& workspace) {
    return workspace.References(place.File(workspace), place.Offset(workspace), everywhere);
  });
}

nb::list NamedBy(WorkspaceObject& self, nb::handle dotted) {
  const HostText name = HostText::FromBytes(dotted);
  return AskLocations(self, [&](Workspace& workspace) { return workspace.Named(name.text()); });
}

nb::list TypesAt(WorkspaceObject& self, nb::handle path, int line, int column) {
  const AskedPlace place(path, line, column);
  const std::vector<std::string> types =
      self.Asked([&](Workspace& workspace) { return workspace.Types(place.File(workspace), place.Offset(workspace)); });
  nb::list rows;
  for (const std::string& type : types) rows.append(Checked(ShownText(type)));
  return rows;
}

template <class Ask>
nb::object AskHover(WorkspaceObject& self, const AskedPlace& place, Ask&& ask) {
  auto [hover, range] = self.Asked([&](Workspace& workspace) {
    const FileId file = place.File(workspace);
    Hover found = ask(workspace, file, place.Offset(workspace));
    Placer placer(workspace);
    const PlacedRange placed = placer.Range(file, found.begin, found.end);
    return std::pair(std::move(found), placed);
  });
  if (hover.text.empty() && hover.types.empty()) return nb::none();
  nb::list types;
  for (const std::string& type : hover.types) types.append(Checked(ShownText(type)));
  return nb::make_tuple(ShownText(hover.text), ShownText(hover.documentation), nb::tuple(types),
                        Word(WordOf(hover.certainty)), range.begin.line, range.begin.col, range.end.col);
}

nb::object HoverOver(WorkspaceObject& self, nb::handle path, int line, int column) {
  return AskHover(self, AskedPlace(path, line, column),
                  [](Workspace& workspace, FileId file, uint32_t offset) { return workspace.HoverAt(file, offset); });
}

nb::object DescriptionOf(WorkspaceObject& self, nb::handle path, int line, int column, nb::handle name) {
  const HostText text = HostText::FromBytes(name);
  return AskHover(self, AskedPlace(path, line, column), [&](Workspace& workspace, FileId file, uint32_t offset) {
    return workspace.DescribeCompletion(file, offset, text.text());
  });
}

nb::list SignaturesAt(WorkspaceObject& self, nb::handle path, int line, int column) {
  const AskedPlace place(path, line, column);
  const std::vector<Signature> signatures = self.Asked(
      [&](Workspace& workspace) { return workspace.Signatures(place.File(workspace), place.Offset(workspace)); });
  nb::list rows;
  for (const Signature& signature : signatures) {
    nb::list parameters;
    for (const Parameter& parameter : signature.parameters)
      parameters.append(nb::make_tuple(ShownText(parameter.label), ShownText(parameter.name)));
    nb::object active = nb::none();
    if (signature.active >= 0) active = nb::int_(signature.active);
    rows.append(nb::make_tuple(ShownText(signature.label), ShownText(signature.documentation), nb::tuple(parameters),
                               active, Word(WordOf(signature.certainty))));
  }
  return rows;
}

nb::list CompletionsAt(WorkspaceObject& self, nb::handle path, int line, int column) {
  const AskedPlace place(path, line, column);
  const std::vector<Completion> completions = self.Asked(
      [&](Workspace& workspace) { return workspace.Complete(place.File(workspace), place.Offset(workspace)); });
  nb::list rows;
  for (const Completion& completion : completions) {
    rows.append(nb::make_tuple(ShownText(completion.name), Word(completion.kind), ShownText(completion.detail),
                               ShownText(completion.documentation), Word(WordOf(completion.certainty))));
  }
  return rows;
}

// (edits, None) or (None, problem).
nb::tuple RenameAt(WorkspaceObject& self, nb::handle path, int line, int column, nb::handle name, bool only_certain) {
  const AskedPlace place(path, line, column);
  const HostText new_name = HostText::FromBytes(name);
  struct Answer {
    Rename rename;
    std::vector<PlacedRange> ranges;
    std::unordered_map<FileId, std::string> paths;
  };
  const Answer answer = self.Asked([&](Workspace& workspace) {
    Answer made;
    made.rename = workspace.RenameTo(place.File(workspace), place.Offset(workspace), new_name.text(), only_certain);
    Placer placer(workspace);
    for (const TextEdit& edit : made.rename.edits) made.ranges.push_back(placer.Range(edit.file, edit.begin, edit.end));
    made.paths = placer.TakePaths();
    return made;
  });
  if (!answer.rename.problem.empty()) return nb::make_tuple(nb::none(), ShownText(answer.rename.problem));
  Rows paths(answer.paths);
  nb::list rows;
  for (size_t i = 0; i < answer.ranges.size(); ++i) {
    const PlacedRange& range = answer.ranges[i];
    rows.append(nb::make_tuple(paths.Path(range.file), range.begin.line, range.begin.col, range.end.col,
                               ShownText(answer.rename.edits[i].text)));
  }
  return nb::make_tuple(rows, nb::none());
}

// A row is a location of the function, its qualified name, and where it calls or is called.
using CallQuestion = std::vector<Call> (Workspace::*)(FileId, uint32_t);
template <CallQuestion kQuestion>
nb::list CallsAt(WorkspaceObject& self, nb::handle path, int line, int column) {
  const AskedPlace place(path, line, column);
  struct PlacedCall {
    PlacedLocation function;
    std::string name;
    std::vector<PlacedLocation> calls;
  };
  auto [placed, paths] = self.Asked([&](Workspace& workspace) {
    Placer placer(workspace);
    std::vector<PlacedCall> calls;
    for (Call& call : (workspace.*kQuestion)(place.File(workspace), place.Offset(workspace)))
      calls.push_back({placer.Of(call.function), std::move(call.name), placer.All(call.calls)});
    return std::pair(std::move(calls), placer.TakePaths());
  });
  Rows rows(std::move(paths));
  nb::list list;
  for (const PlacedCall& call : placed)
    list.append(nb::make_tuple(rows.LocationRow(call.function), ShownText(call.name), rows.LocationRows(call.calls)));
  return list;
}

// ---- whole files and projects ----

nb::list SymbolsLike(WorkspaceObject& self, nb::handle query, size_t most) {
  const HostText asked = HostText::FromBytes(query);
  std::unordered_map<FileId, std::string> paths;
  const std::vector<SymbolInfo> symbols = self.Asked([&](Workspace& workspace) {
    std::vector<SymbolInfo> found = workspace.Symbols(asked.text(), most);
    for (const SymbolInfo& symbol : found)
      if (!paths.contains(symbol.file)) paths.emplace(symbol.file, workspace.PathOf(symbol.file));
    return found;
  });
  Rows hosts(std::move(paths));
  nb::list rows;
  for (const SymbolInfo& symbol : symbols) {
    rows.append(nb::make_tuple(ShownText(symbol.name), Word(symbol.kind), ShownText(symbol.container),
                               hosts.Path(symbol.file), symbol.place.line, symbol.place.col, symbol.end_column));
  }
  return rows;
}

// A row has the index of the item around it, or None.
nb::list OutlineOf(WorkspaceObject& self, nb::handle path) {
  const AskedPlace place(path, 1, 1);
  struct Row {
    OutlineItem item;
    PlacedRange name;
    PlacedRange whole;
  };
  const std::vector<Row> items = self.Asked([&](Workspace& workspace) {
    const FileId file = place.File(workspace);
    Placer placer(workspace);
    std::vector<Row> made;
    for (OutlineItem& item : workspace.Outline(file)) {
      const PlacedRange name = placer.Range(file, item.name_begin, item.name_end);
      const PlacedRange whole = placer.Range(file, item.begin, item.end);
      made.push_back({std::move(item), name, whole});
    }
    return made;
  });
  nb::list rows;
  for (const Row& row : items) {
    nb::object parent = nb::none();
    if (row.item.parent >= 0) parent = nb::int_(row.item.parent);
    rows.append(nb::make_tuple(parent, ShownText(row.item.name), Word(row.item.kind), ShownText(row.item.detail),
                               row.name.begin.line, row.name.begin.col, row.name.end.col, row.whole.begin.line,
                               row.whole.end.line, row.whole.begin.col, row.whole.end.col));
  }
  return rows;
}

nb::list ProblemsOf(WorkspaceObject& self, nb::handle path) {
  const AskedPlace place(path, 1, 1);
  const auto problems = self.Asked([&](Workspace& workspace) {
    const FileId file = place.File(workspace);
    Placer placer(workspace);
    std::vector<std::pair<Problem, PlacedRange>> made;
    for (Problem& problem : workspace.Problems(file)) {
      const PlacedRange range = placer.Range(file, problem.begin, problem.end);
      made.emplace_back(std::move(problem), range);
    }
    return made;
  });
  nb::list rows;
  for (const auto& [problem, range] : problems) {
    rows.append(nb::make_tuple(range.begin.line, range.begin.col, range.end.line, range.end.col, Word(problem.code),
                               ShownText(problem.message)));
  }
  return rows;
}

nb::object LineAt(WorkspaceObject& self, nb::handle path, int line) {
  const AskedPlace place(path, line, 1);
  const std::string bytes = self.Asked(
      [&](Workspace& workspace) { return workspace.LineOf(place.File(workspace), place.Offset(workspace)); });
  return BytesOf(bytes);
}

// ---- buffers ----

void OpenBuffer(WorkspaceObject& self, nb::handle path, nb::handle text) {
  const HostText file = HostText::FromBytes(path);
  std::string bytes(HostText::FromBytes(text).text());
  self.Asked([&](Workspace& workspace) { workspace.Open(workspace.FileOf(file.text()), std::move(bytes)); });
}

void ChangeBuffer(WorkspaceObject& self, nb::handle path, nb::handle begin, nb::handle end, nb::handle text) {
  const HostText file = HostText::FromBytes(path);
  const HostText bytes = HostText::FromBytes(text);
  const std::vector<Position> places = PositionsOf(nb::make_tuple(begin, end));
  self.Asked([&](Workspace& workspace) {
    const FileId id = workspace.FileOf(file.text());
    const auto offset = [&](const Position& at) { return workspace.OffsetOf(id, at.line, at.col); };
    const uint32_t from = offset(places[0]);
    workspace.Change(id, from, std::max(from, offset(places[1])), bytes.text());
  });
}

void CloseBuffer(WorkspaceObject& self, nb::handle path) {
  const HostText file = HostText::FromBytes(path);
  self.Asked([&](Workspace& workspace) { workspace.Close(workspace.FileOf(file.text())); });
}

bool CanReadFile(WorkspaceObject& self, nb::handle path) {
  const HostText file = HostText::FromBytes(path);
  return self.Asked([&](Workspace& workspace) { return workspace.CanRead(workspace.FileOf(file.text())); });
}

}  // namespace

void BindQuestions(nb::module_& host) {
  nb::class_<WorkspaceObject> workspace(host, "Workspace", "Questions about the programs below some folders.");
  workspace.def(nb::init<nb::handle, nb::handle, nb::handle, nb::handle, nb::handle, nb::handle, const Language&>(),
                nb::arg("roots"), nb::arg("libraries"), nb::arg("typeshed"), nb::arg("version_triple"),
                nb::arg("exclude"), nb::arg("index_maker"), nb::arg("language"));
  const auto def_at = [&workspace](const char* name, auto function, const char* doc) {
    workspace.def(name, function, nb::arg("path"), nb::arg("line"), nb::arg("column"), doc);
  };
  def_at("Definitions", &LocationsAt<&Workspace::Definitions>,
         "Rows (path, line, column, end column, role, kind, certainty).");
  def_at("TypeDefinitions", &LocationsAt<&Workspace::TypeDefinitions>, "Likewise.");
  def_at("Declarations", &LocationsAt<&Workspace::Declarations>, "Likewise.");
  def_at("Implementations", &LocationsAt<&Workspace::Implementations>, "Likewise.");
  def_at("Supertypes", &LocationsAt<&Workspace::Supertypes>, "Likewise.");
  def_at("Subtypes", &LocationsAt<&Workspace::Subtypes>, "Likewise.");
  def_at("Types", &TypesAt, "Types as text.");
  def_at("Hover", &HoverOver, "(text, documentation, types, certainty, line, column, end column), or None.");
  def_at("Signatures", &SignaturesAt, "Rows (label, documentation, parameters, active, certainty).");
  def_at("Complete", &CompletionsAt, "Rows (name, kind, detail, documentation, certainty).");
  def_at("Callers", &CallsAt<&Workspace::Callers>, "Rows (location, name, locations).");
  def_at("Callees", &CallsAt<&Workspace::Callees>, "Likewise.");
  workspace.def("DescribeCompletion", &DescriptionOf, nb::arg("path"), nb::arg("line"), nb::arg("column"),
                nb::arg("name"));
  workspace.def("References", &ReferencesAt, nb::arg("path"), nb::arg("line"), nb::arg("column"), nb::arg("everywhere"))
      .def("Rename", &RenameAt, nb::arg("path"), nb::arg("line"), nb::arg("column"), nb::arg("name"),
           nb::arg("only_certain"), "(rows (path, line, column, end column, text), None), or (None, why not).")
      .def("Named", &NamedBy, nb::arg("dotted"))
      .def("Symbols", &SymbolsLike, nb::arg("query"), nb::arg("most"))
      .def("Outline", &OutlineOf, nb::arg("path"))
      .def("Problems", &ProblemsOf, nb::arg("path"))
      .def("LineOf", &LineAt, nb::arg("path"), nb::arg("line"))
      .def("Open", &OpenBuffer, nb::arg("path"), nb::arg("text"))
      .def("Change", &ChangeBuffer, nb::arg("path"), nb::arg("begin"), nb::arg("end"), nb::arg("text"))
      .def("Close", &CloseBuffer, nb::arg("path"))
      .def("CanRead", &CanReadFile, nb::arg("path"))
      .def("Stop", &WorkspaceObject::Stop, nb::arg("patience"))
      .def("SetColumnUnit", &WorkspaceObject::SetColumnUnit, nb::arg("name"))
      .def("Proceed", &WorkspaceObject::Proceed)
      .def("Refresh", [](WorkspaceObject& self) { self.Asked([](Workspace& at) { at.Refresh(); }); })
      .def_prop_ro("was_bounded",
                   [](WorkspaceObject& self) { return self.Asked([](Workspace& at) { return at.was_bounded(); }); })
      .def_prop_ro("byte_count",
                   [](WorkspaceObject& self) { return self.Asked([](Workspace& at) { return at.ByteSize(); }); });
  BindShapes(workspace);
}

}  // namespace quillet::host
