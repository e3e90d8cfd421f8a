// What the package's host API needs of the core: a whole source, analysed, its lines made when they are read.
#include <nanobind/stl/string.h>
#include <nanobind/stl/vector.h>

#include <vector>

#include "bindings/analyzed_source.h"
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/language_object.h"
#include "bindings/line_object.h"
#include "bindings/signals.h"

namespace quillet::host {
namespace {

void BindLanguage(nb::module_& host) {
  nb::class_<Language>(host, "Language", "What an analyzer is built from. Grammar files are absolute paths.")
      .def(nb::init<nb::handle, std::string, std::string, std::vector<std::string>, bool, std::string, bool>(),
           nb::arg("version_triple"), nb::arg("grammar_file"), nb::arg("hint_grammar_file"), nb::arg("keyword_seq"),
           nb::arg("py3_grammar"), nb::arg("print_function_grammar_file"), nb::arg("exact"));
}

}  // namespace

void BindHost(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  tarvex.attr("_host") = host;
  InstallInterrupts();
  BindLanguage(host);
  BindAnalyzedLine(host);
  BindCutSource(host);
  nb::class_<AnalyzedSource>(host, "AnalyzedSource",
                             "A UTF-8 source: its logical lines, and what each was found to say.")
      .def(
          "__init__",
          [](AnalyzedSource* self, Language& language, Any source, nb::handle record_class, const nb::tuple& kinds) {
            const HostText text = HostText::FromBytes(source);
            new (self) AnalyzedSource(language, text.text(), record_class, kinds);
          },
          nb::arg("language"), nb::arg("source"), nb::arg("record_class"), nb::arg("kinds"),
          "Records are (name, kind, detail, is_parameter), instances of a class that derives from tuple.")
      .def("__len__", &AnalyzedSource::size)
      .def(
          "MakeLines",
          [](nb::handle self, const nb::list& lines, size_t begin, size_t end, nb::handle line_class) {
            return MakeLines(self, nb::cast<const AnalyzedSource&>(self), lines, begin, end, line_class);
          },
          nb::arg("lines"), nb::arg("begin"), nb::arg("end"), nb::arg("line_class"),
          "The lines from `begin` up to `end`, made for each place of the list that holds None, and put there.")
      .def_prop_ro("print_function", &AnalyzedSource::has_print_function)
      .def_prop_ro("rows_with_error", [](AnalyzedSource& self) { return self.rows_with_error(); });
}

}  // namespace quillet::host
