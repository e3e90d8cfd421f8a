// _host.FileResult: a file's columns, and rows made of them.
#include <nanobind/stl/unique_ptr.h>

#include <algorithm>
#include <string>

#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/file_result.h"
#include "bindings/result_bytes.h"

namespace quillet::host {

namespace {

const char* WordOf(ScopeNames::ScopeKind kind) {
  switch (kind) {
    case ScopeNames::ScopeKind::kModule:
      return "module";
    case ScopeNames::ScopeKind::kClass:
      return "class";
    case ScopeNames::ScopeKind::kFunction:
      return "def";
    case ScopeNames::ScopeKind::kTypeAlias:
      return "type";
  }
  return "";
}

// The buffer of a result is its output: what a format wrote, without a copy.
int OutputBuffer(PyObject* self, Py_buffer* view, int flags) {
  if (!nb::inst_ready(self)) {
    PyErr_SetString(PyExc_BufferError, "the object was not initialised");
    return -1;
  }
  std::string& output = nb::inst_ptr<FileResult>(self)->result.output;
  return PyBuffer_FillInfo(view, self, output.data(), static_cast<Py_ssize_t>(output.size()), 1, flags);
}

PyType_Slot file_result_slots[] = {{Py_bf_getbuffer, reinterpret_cast<void*>(OutputBuffer)}, {0, nullptr}};

}  // namespace

nb::list FileResult::Messages(const std::vector<BatchResult::Message>& messages) const {
  nb::list list;
  for (const BatchResult::Message& message : messages)
    list.append(nb::make_tuple(message.line, message.column, Checked(ShownText(message.text))));
  return list;
}

nb::list FileResult::Definitions(nb::handle row_class) {
  nb::list list;
  for (const RecordTable::Definition& definition : result.table.definitions) {
    list.append(row_class(scopes[definition.scope], WordOf(definition.kind), definition.line, definition.column,
                          definition.first_line, definition.last_line));
  }
  return list;
}

nb::list FileResult::Rows(size_t begin, size_t end, nb::handle row_class, const nb::tuple& kinds) {
  const RecordTable& table = result.table;
  CheckRowClass(row_class);
  if (kinds.size() != RecordKindWords().size()) ThrowError(ErrorKind::kValueError, "an object a kind is needed");
  end = std::min(end, table.size());
  begin = std::min(begin, end);
  nb::list rows;
  for (size_t i = begin; i < end; ++i) {
    TupleFiller row(row_class, 7);
    row.Add(table.lines[i]);
    row.Add(table.columns[i]);
    row.Add(scopes[table.scopes[i]]);
    row.Add(names[table.names[i]]);
    row.Add(nb::borrow(kinds[static_cast<size_t>(table.kinds[i])]));
    row.Add(details[table.details[i]]);
    row.Add(nb::borrow(table.is_parameter[i] ? Py_True : Py_False));
    rows.append(row.TakePlain());
  }
  return rows;
}

std::unique_ptr<FileNames> FileResult::Names() const {
  return result.bindings ? std::make_unique<FileNames>(result.bindings) : nullptr;
}

void BindFileResult(nb::module_& host) {
  nb::class_<FileResult>(host, "FileResult", nb::type_slots(file_result_slots),
                         "What became of a file of a batch. Its buffer is what a format wrote of it.")
      .def_prop_ro("index", [](const FileResult& self) { return self.result.index; })
      .def_prop_ro("problem",
                   [](const FileResult& self) {
                     return self.result.problem.empty() ? nb::object(nb::none()) : StrOf(self.result.problem);
                   })
      .def_prop_ro("byte_count", [](const FileResult& self) { return self.result.byte_count; })
      .def_prop_ro("line_count", [](const FileResult& self) { return self.result.line_count; })
      .def_prop_ro("statement_count", [](const FileResult& self) { return self.result.statement_count; })
      .def_prop_ro("errors", [](const FileResult& self) { return self.Messages(self.result.errors); })
      .def_prop_ro("reports", [](const FileResult& self) { return self.Messages(self.result.reports); })
      .def_prop_ro("names", &FileResult::Names)
      .def_prop_ro("record_count", [](const FileResult& self) { return self.result.table.size(); })
      .def(
          "ToBytes", [](const FileResult& self) { return BytesOf(BytesOfResult(self.result)); },
          "All of it as bytes, for FromBytes of the same build.")
      .def_static(
          "FromBytes",
          [](nb::handle bytes) {
            auto made = std::make_unique<FileResult>();
            ReadResult(HostText::FromBytes(bytes).text(), made->result);
            return made;
          },
          nb::arg("bytes"))
      .def("Definitions", &FileResult::Definitions, nb::arg("row_class"),
           "Classes, functions and type aliases: row_class(scope, kind, line, column, first_line, last_line).")
      .def("Rows", &FileResult::Rows, nb::arg("begin"), nb::arg("end"), nb::arg("row_class"), nb::arg("kinds"),
           "Records from `begin` up to `end` as instances of a class that derives from tuple.");
}

}  // namespace quillet::host
