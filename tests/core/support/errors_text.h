// The errors of a source as one text, for tests: "line:column message" each, in the order of the statements.
#pragma once

#include <string>

#include "analysis/file_analyzer.h"

namespace quillet::testing {

inline std::string ErrorsOf(FileAnalyzer& files, const char* source) {
  files.Analyze(Text(source));
  std::string errors;
  for (size_t row = 0; row < files.rows().size(); ++row) {
    const int32_t error = files.results()[row].error;
    if (error < 0) continue;
    const Position place = files.ErrorPosition(row);
    if (!errors.empty()) errors += "; ";
    errors += std::to_string(place.line + 1) + ":" + std::to_string(place.col + 1) + " ";
    errors += files.errors()[static_cast<size_t>(error)].message();
  }
  return errors;
}

}  // namespace quillet::testing
