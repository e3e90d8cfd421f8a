// A source that the host API had analysed: its rows and records, and its lines as objects of the host's.
//
// A line of the host's, a Python object of a class that derives from _host.AnalyzedLine, knows its source and its
// number. What it says is looked up, or made and kept, when it is read, so that a line costs little more than its
// memory.
#pragma once

#include <vector>

#include "analysis/file_analyzer.h"
#include "bindings/bindings.h"
#include "bindings/language_object.h"
#include "bindings/line_object.h"
#include "foundations/text.h"

namespace quillet::host {

class AnalyzedSource {
 public:
  // `record_class` derives from tuple, `kinds` has an object a kind of records.
  AnalyzedSource(Language& language, Text bytes, nb::handle record_class, const nb::tuple& kinds);
  AnalyzedSource(const AnalyzedSource&) = delete;
  AnalyzedSource& operator=(const AnalyzedSource&) = delete;

  size_t size() const { return found_.rows.size(); }
  // Whether the source switches the print function on, which 2.7 parses otherwise.
  bool has_print_function() const;
  const std::vector<size_t>& rows_with_error() const { return rows_with_error_; }

  // ---- of a line by its number, which must be below size() ----
  const LineRow& row(size_t i) const { return found_.rows[i]; }
  const FileAnalyzer::LineResult& result(size_t i) const { return found_.results[i]; }
  // As a CLogicalLine, a new one each time.
  nb::object LogicalOf(size_t i) const;
  // The SyntaxError, a new one each time, or None.
  nb::object ErrorOf(size_t i) const;
  // The records as found: (name, kind, detail, is_parameter).
  nb::object RecordsOf(size_t i) const;

 private:
  FileAnalyzer::Found found_;
  Ref<SharedCut> cut_;
  std::vector<size_t> rows_with_error_;
  nb::object record_class_;
  nb::tuple kinds_;
};

// The lines from `begin` up to `end`: those that stand in a list with a place for each line of the source, and in
// place of each None there a new one, an instance of a class that derives from AnalyzedLine. `owner` is the host's
// object of the source.
nb::list MakeLines(nb::handle owner, const AnalyzedSource& source, const nb::list& lines, size_t begin, size_t end,
                   nb::handle line_class);

// Adds the class AnalyzedLine.
void BindAnalyzedLine(nb::module_& host);

}  // namespace quillet::host
