// _host.NativeBatch: many sources through the native path, bytes in memory to records in their
// arenas, without the interpreter lock and without an object a line.
#include <nanobind/stl/string.h>
#include <nanobind/stl/vector.h>

#include <utility>
#include <vector>

#include "analysis/file_analyzer.h"
#include "quillet/tarvex/bindings.h"
#include "quillet/tarvex/convert.h"

namespace quillet::host {
namespace {

class NativeBatch {
 public:
  NativeBatch(nb::handle version_triple, std::string grammar_file, std::string hint_grammar_file,
              std::vector<std::string> keywords, bool py3_grammar, std::string print_function_grammar_file)
      : files_([&] {
          FileAnalyzer::Options options;
          options.version = VersionOf(version_triple);
          options.grammar_file = std::move(grammar_file);
          options.hint_grammar_file = std::move(hint_grammar_file);
          options.hint_keywords = keywords;
          options.keywords = std::move(keywords);
          options.py3_grammar = py3_grammar;
          options.print_function_grammar_file = std::move(print_function_grammar_file);
          return options;
        }()) {}

  // The number of records and of statements rejected, over all sources.
  std::pair<size_t, size_t> Analyze(nb::handle sources) {
    const nb::object tuple = TupleOf(sources);
    std::vector<HostText> texts;
    for (nb::handle source : nb::cast<nb::tuple>(tuple)) texts.push_back(HostText::FromBytes(source));
    size_t records = 0;
    size_t rejected = 0;
    nb::gil_scoped_release unlocked;
    for (const HostText& text : texts) {
      files_.Analyze(text.text());
      records += files_.store().rows.size() + files_.store().arg_rows.size();
      rejected += files_.errors().size();
    }
    return {records, rejected};
  }

 private:
  FileAnalyzer files_;
};

}  // namespace

void BindBatch(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  nb::class_<NativeBatch>(host, "NativeBatch",
                          "Sources through the native path, without an object a line. Grammar files are absolute "
                          "paths; one thread at a time.")
      .def(nb::init<nb::handle, std::string, std::string, std::vector<std::string>, bool, std::string>(),
           nb::arg("version_triple"), nb::arg("grammar_file"), nb::arg("hint_grammar_file"), nb::arg("keyword_seq"),
           nb::arg("py3_grammar"), nb::arg("print_function_grammar_file"))
      .def(
          "Analyze",
          [](NativeBatch& self, nb::handle sources) {
            const auto [records, rejected] = self.Analyze(sources);
            return nb::make_tuple(records, rejected);
          },
          nb::arg("sources"), "Analyses UTF-8 sources, a sequence of bytes; gives (records, statements rejected).");
}

}  // namespace quillet::host
