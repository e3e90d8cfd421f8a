// What became of a file of a batch, as the host sees it: columns of the core until it asks for some of them.
#pragma once

#include <memory>
#include <vector>

#include "analysis/batch.h"
#include "bindings/bindings.h"
#include "bindings/names_object.h"
#include "bindings/rows.h"

namespace quillet::host {

struct FileResult {
  BatchResult result;
  ShownTexts scopes{result.table.scope_texts};
  ShownTexts names{result.table.name_texts};
  ShownTexts details{result.table.detail_texts};

  FileResult() = default;
  FileResult(const FileResult&) = delete;
  FileResult& operator=(const FileResult&) = delete;

  nb::list Messages(const std::vector<BatchResult::Message>& messages) const;
  // None for a result of a batch that does not bind, and for a file with a problem.
  std::unique_ptr<FileNames> Names() const;
  nb::list Definitions(nb::handle row_class);
  // Records as instances of a class that derives from tuple, with the host's own objects for kinds.
  nb::list Rows(size_t begin, size_t end, nb::handle row_class, const nb::tuple& kinds);
};

void BindFileResult(nb::module_& host);
void BindRecordRows(nb::module_& host);

}  // namespace quillet::host
