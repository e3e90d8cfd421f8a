// Workspaces, and what walks over files asks of the core: whether ignore rules exclude a path.
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/workspace_object.h"
#include "workspace/ignore_rules.h"

namespace quillet::host {

void BindWorkspace(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
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
