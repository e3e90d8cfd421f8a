// Workspaces, and what walks over files asks of the core: which ones there are, and whether ignore rules exclude a
// path.
#include <string>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/interpreter_lock.h"
#include "bindings/signals.h"
#include "bindings/workspace_object.h"
#include "foundations/stop.h"
#include "project/find_files.h"
#include "project/ignore_rules.h"

namespace quillet::host {

namespace {

nb::list FoundFiles(nb::handle arguments, bool gitignore, nb::handle exclude) {
  std::vector<std::string> paths;
  for (nb::handle path : nb::borrow<nb::tuple>(TupleOf(arguments)))
    paths.emplace_back(HostText::FromBytes(path).text());
  const std::string patterns(HostText::FromBytes(exclude).text());
  std::vector<FoundFile> found;
  {
    const Unlocked unlocked;
    const ThreadStopQuestion signals(HandlesSignals());
    found = FindFiles(paths, {.gitignore = gitignore, .exclude = patterns});
  }
  nb::list files;
  for (const FoundFile& file : found) {
    files.append(nb::make_tuple(BytesOf(file.path), file.problem.empty() ? nb::object(nb::none()) : StrOf(file.problem),
                                file.argument, file.below, file.size, file.time));
  }
  return files;
}

}  // namespace

void BindWorkspace(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  host.def("FindFiles", &FoundFiles, nb::arg("arguments"), nb::arg("gitignore"), nb::arg("exclude"),
           "The Python files of paths, as tuples (path, problem, argument, below, size, time): where the path goes on "
           "below its argument, 0 for the argument itself.");
  nb::class_<IgnoreRules>(host, "IgnoreRules", "The rules of the content of a .gitignore file, read as git reads it.")
      .def(
          "__init__",
          [](IgnoreRules* self, nb::bytes text) { new (self) IgnoreRules(Text(text.c_str(), text.size())); },
          nb::arg("text"))
      .def(
          "Verdict",
          [](IgnoreRules& self, nb::bytes path, bool is_folder) -> nb::object {
            switch (self.Of(Text(path.c_str(), path.size()), is_folder)) {
              case IgnoreRules::Verdict::kNone:
                return nb::none();
              case IgnoreRules::Verdict::kExcluded:
                return nb::bool_(true);
              case IgnoreRules::Verdict::kIncluded:
                return nb::bool_(false);
            }
            return nb::none();
          },
          nb::arg("path"), nb::arg("is_folder"),
          "Whether the last rule that matches excludes a path, given from their folder; None where none matches.");
  BindEnvironment(host);
  BindQuestions(host);
}

}  // namespace quillet::host
