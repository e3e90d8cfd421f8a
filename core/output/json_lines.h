// A file's statements as JSON lines: one object a statement that has records or an error, ASCII only.
//
// The keys are those that docs/cli.md lists. A byte of a path that is part of no character is written as
// the lone surrogate that Python has for it (\udcff for 0xFF); all other text is UTF-8 by now.
#pragma once

#include <memory>
#include <string>

#include "analysis/batch.h"

namespace quillet {

// Appends a text as a JSON string with its quotes.
void AppendJsonString(Text text, std::string& out);

struct JsonLinesOptions {
  bool errors_only = false;
};
std::unique_ptr<FileWriter> MakeJsonLinesWriter(const JsonLinesOptions& options);

}  // namespace quillet
