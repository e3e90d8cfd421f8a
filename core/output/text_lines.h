// A file's statements and their records as text for people: `path:line: statement` and the records below
// it, a syntax error with its source line and a caret. docs/cli.md shows both.
//
// Source text and file names come from anywhere, so whatever moves a terminal's cursor, changes its
// state or reverses its text is shown as an escape. How wide a character is on a terminal is known to
// the host alone; ASCII is settled here.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "analysis/batch.h"

namespace quillet {

// Appends a text with control characters as escapes, and odd bytes as the surrogates that Python has for
// them: one line, safe to show. Tabs are kept.
void AppendPrintable(Text text, std::string& out);

// Appends what is shown of a source line: without white space at both ends, safe, and cut where it is long.
void AppendSourceLine(Text line, std::string& out);

// Appends a text in a colour, which is the number of a terminal's escape, where it is not empty.
inline constexpr Text kPlaceColour = "36";
inline constexpr Text kNameColour = "1";
inline constexpr Text kErrorColour = "1;31";
void AppendColoured(Text colour, Text text, std::string& out);

struct TextLinesOptions {
  bool errors_only = false;
  bool colours = false;
  // The cells that a character beyond ASCII takes on a terminal; without it, one. For any thread.
  std::function<uint32_t(uint32_t code_point)> width_of;
};
std::unique_ptr<FileWriter> MakeTextLinesWriter(const TextLinesOptions& options);

}  // namespace quillet
