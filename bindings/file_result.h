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
  // Records as rows of integers for a database that holds texts by numbers, `rows_per_tuple` in each
  // tuple: what is left behind the last full one is in nobody's. A row has kDatabaseColumns, which are
  // id, name, scope, line, column, kind, is_parameter, opens, detail; record i has the id first_id + i.
  nb::list NumberedRows(size_t begin, size_t end, size_t rows_per_tuple, size_t first_id, nb::handle name_numbers,
                        nb::handle scope_numbers, nb::handle detail_numbers) const;
};

void BindFileResult(nb::module_& host);

}  // namespace quillet::host
