// What the package's host API needs of the core: a source cut into lines, each with its place.
#include <memory>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/line_object.h"
#include "lines/cutter.h"
#include "lines/future_imports.h"
#include "lines/scopes.h"

namespace quillet::host {
namespace {

// A sequence of rows; a row's objects are made when the host asks for it.
struct CutSource {
  Ref<SourceText> source;
  std::shared_ptr<SharedStore> store = std::make_shared<SharedStore>();
  std::vector<LineRow> rows;
  std::vector<LinePlace> places;

  CutSource(Text bytes, Version version) : source(SourceText::Copy(bytes)) {
    {
      nb::gil_scoped_release unlocked;
      CutLines(*source, version, rows);
      places.reserve(rows.size());
      ScopeTracker scopes;
      for (const LineRow& row : rows) places.push_back(scopes.Next(row));
    }
  }

  nb::object At(int64_t index) const {
    const int64_t count = static_cast<int64_t>(rows.size());
    if (index < 0) index += count;
    if (index < 0 || index >= count) ThrowError(ErrorKind::kIndexError, "line index out of range");
    const LineRow& row = rows[index];
    return nb::make_tuple(NewLineObject(source, row, store), row.first_line, row.last_line, row.indent,
                          places[index].in_async_def, places[index].first_in_def);
  }
};

}  // namespace

void BindHost(nb::module_& tarvex) {
  nb::module_ m = SiblingModule(tarvex, "host");
  tarvex.attr("_host") = m;
  nb::class_<CutSource> cls(m, "CutSource",
                            "The logical lines of a UTF-8 source, as (logical, first_line, last_line, indent, "
                            "in_async_def, first_in_def), with lines counted from 0.");
  cls.def(
      "__init__",
      [](CutSource* self, Any source, Any version_triple) {
        const HostText text = HostText::FromBytes(source);
        new (self) CutSource(text.text(), VersionOf(version_triple));
      },
      nb::arg("source"), nb::arg("version_triple"));
  cls.def_prop_ro(
      "print_function", [](CutSource& self) { return ImportsPrintFunction(*self.source, self.rows); },
      "Whether the source switches the print function on, which 2.7 parses otherwise.");
  cls.def("__iter__", [](nb::handle self) { return nb::steal(PySeqIter_New(self.ptr())); });
  cls.def("__len__", [](CutSource& self) { return self.rows.size(); });
  cls.def(
      "__getitem__", [](CutSource& self, Any index) { return self.At(Int64Of(index)); }, nb::arg("index"));
}

}  // namespace quillet::host
