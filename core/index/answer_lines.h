// Answers as people and programs read them: `path:line:column: source line`, or a JSON object a line.
// docs/index.md shows all forms.
//
// An answer is written where it is found, on the thread of its file. Everything of a source is made safe to
// show (output/text_lines.h).
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "index/question.h"

namespace quillet {

struct AnswerLinesOptions {
  enum class Form : uint8_t {
    kPlaces,
    kLong,  // below each place what is said of the name there
    kJson,
    kNone,  // for who counts
  };
  Form form = Form::kPlaces;
  bool colours = false;
  std::string folder;  // a path that begins with it is shown without it
};

std::unique_ptr<AnswerFormat> MakeAnswerLines(const AnswerLinesOptions& options);

// What such a format wrote of a file.
struct AnswerLines {
  uint64_t place_count;
  Text lines;
};
std::optional<AnswerLines> ReadAnswerLines(Text written);

}  // namespace quillet
