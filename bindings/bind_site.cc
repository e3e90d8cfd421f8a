// The index of a site: filled in the interpreter's thread, read by the threads that write pages.
#include <nanobind/stl/string.h>
#include <nanobind/stl/vector.h>

#include "bindings/bindings.h"
#include "bindings/buffer_text.h"
#include "bindings/convert.h"
#include "bindings/site_object.h"
#include "foundations/errors.h"

namespace quillet::host {

void BindSite(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  host.attr("SITE_PAGE_HEAD_SIZE") = kSitePageHeadSize;
  host.attr("SITE_MOST_BYTES") = ShownPart::kMostBytes;
  host.attr("SITE_MOST_BYTES_OF_LINE") = ShownPart::kMostBytesOfLine;
  nb::class_<SiteObject>(host, "SiteIndex", "What the pages of a site know of each other.")
      .def(
          "__init__",
          [](SiteObject* self, const std::vector<std::string>& files,
             const std::vector<std::string>& builtin_attributes) {
            new (self) SiteObject{std::make_shared<SiteIndex>(files, builtin_attributes)};
          },
          nb::arg("files"), nb::arg("builtin_attributes"),
          "For files of these names, where values of the language's own types have these attributes.")
      .def(
          "Add",
          [](SiteObject& self, uint32_t file, nb::handle survey) {
            self.Changing().Add(file, BufferText(survey).text());
          },
          nb::arg("file"), nb::arg("survey"), "Takes what the format \"site survey\" wrote of the file of this number.")
      .def_prop_ro("waiting_bytes", [](const SiteObject& self) { return self.index->waiting_bytes(); })
      .def(
          "TakeBuckets",
          [](SiteObject& self) {
            nb::list taken;
            for (size_t i = 0; i < SiteIndex::kBuckets; ++i) taken.append(BytesOf(self.Changing().TakeBucket(i)));
            return taken;
          },
          "All that waits, as bytes by bucket.")
      .def_prop_ro("script_count", [](const SiteObject& self) { return self.index->ScriptCount(); })
      .def_prop_ro("definition_count", [](const SiteObject& self) { return self.index->definition_count(); })
      .def(
          "PlacesScript",
          [](const SiteObject& self, nb::handle buckets) {
            const BufferText bytes(buckets);
            return BytesOf(self.index->PlacesScript(bytes.text()));
          },
          nb::arg("buckets"))
      .def("DefinitionsScript", [](const SiteObject& self) { return BytesOf(self.index->DefinitionsScript()); });
}

}  // namespace quillet::host
