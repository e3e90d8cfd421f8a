// _host.RecordRows: the records of files as pages of a database, and the texts that its rows number.
#include <algorithm>
#include <new>

#include "bindings/buffer_text.h"
#include "bindings/convert.h"
#include "bindings/file_result.h"
#include "output/record_rows.h"

namespace quillet::host {

namespace {

// Rows (number, text), with what stands behind the last dot where that is wanted, as a database takes them.
nb::list TextRows(const TextTable& texts, size_t begin, size_t end, bool with_tail) {
  nb::list rows;
  end = std::min(end, texts.size());
  for (size_t i = begin; i < end; ++i) {
    const Text text = texts.TextOf(static_cast<uint32_t>(i));
    if (with_tail) {
      rows.append(nb::make_tuple(i, StrOf(text), StrOf(text.substr(text.rfind('.') + 1))));
    } else {
      rows.append(nb::make_tuple(i, StrOf(text)));
    }
  }
  return rows;
}

}  // namespace

void BindRecordRows(nb::module_& host) {
  nb::class_<RecordRows>(host, "RecordRows",
                         "The records of files as pages of an SQLite database, behind those that it has.")
      .def(
          "__init__",
          [](RecordRows* self, nb::handle head) { new (self) RecordRows(HostText::FromBytes(head).text()); },
          nb::arg("head"), "For a database that begins with these bytes.")
      .def(
          "Add",
          [](RecordRows& self, const FileResult& file, uint64_t first_id) { self.Add(file.result.table, first_id); },
          nb::arg("file"), nb::arg("first_id"),
          "Adds the records of a file: id, name, scope, line, column, kind, is_parameter, opens, detail.")
      .def(
          "Take", [](RecordRows& self) { return BytesOf(self.pages().Take()); }, "Pages to append to the file.")
      .def(
          "FinishTable", [](RecordRows& self) { return BytesOf(self.FinishTable()); }, "The root of the table.")
      .def("AddToIndex", &RecordRows::AddToIndex, "Appends a part of the index; whether there is more.")
      .def(
          "FinishIndex", [](RecordRows& self) { return BytesOf(self.FinishIndex()); }, "The root of the index.")
      .def_prop_ro("page_count", [](RecordRows& self) { return self.pages().page_count(); })
      .def_prop_ro("page_size", [](RecordRows& self) { return self.pages().page_size(); })
      .def(
          "Names",
          [](const RecordRows& self, size_t begin, size_t end) { return TextRows(self.names(), begin, end, true); },
          nb::arg("begin"), nb::arg("end"), "Rows (number, name, what is behind its last dot).")
      .def(
          "Details",
          [](const RecordRows& self, size_t begin, size_t end) { return TextRows(self.details(), begin, end, false); },
          nb::arg("begin"), nb::arg("end"), "Rows (number, detail).");
}

}  // namespace quillet::host
