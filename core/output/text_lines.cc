// Text is measured in characters where it is cut, and in cells where it is set in columns.
#include "output/text_lines.h"

#include <algorithm>
#include <charconv>
#include <unordered_map>

#include "foundations/char_tables.h"
#include "foundations/stop.h"
#include "foundations/utf8.h"

namespace quillet {

namespace {

// Records of one statement are set in columns; a name longer than this takes its own width.
constexpr size_t kNameWidth = 20;
// How much of a long line is shown, in characters: an error stands within it.
constexpr size_t kWindow = 160;
constexpr Text kEllipsis = "\xE2\x80\xA6";
constexpr Text kReplacement = "\xEF\xBF\xBD";

bool IsUnsafe(uint32_t c) {
  if (c < 0x20) return c != '\t';
  if (c < 0x7F) return false;
  return c <= 0x9F || c == 0x61C || c == 0x200E || c == 0x200F || (c >= 0x2028 && c <= 0x202E) ||
         (c >= 0x2066 && c <= 0x2069);
}

void AppendHex(uint32_t value, int digits, std::string& out) {
  for (int i = digits - 1; i >= 0; --i) out += "0123456789abcdef"[value >> (4 * i) & 15];
}

void AppendEscaped(uint32_t c, std::string& out) {
  if (c == '\n') {
    out += "\\n";
  } else if (c == '\r') {
    out += "\\r";
  } else if (c < 0x100) {
    out += "\\x";
    AppendHex(c, 2, out);
  } else {
    out += "\\u";
    AppendHex(c, 4, out);
  }
}

// The bytes at `at` that together stand for one replacement character: the longest beginning of a
// character, or one byte.
size_t OddLength(const char* at, const char* end) {
  const auto byte_at = [&](ptrdiff_t i) { return i < end - at ? static_cast<uint8_t>(at[i]) : 0u; };
  const uint32_t b0 = byte_at(0);
  if (b0 < 0xE0 || b0 > 0xF4) return 1;
  const uint32_t lowest = b0 == 0xE0 ? 0xA0 : b0 == 0xF0 ? 0x90 : 0x80;
  const uint32_t highest = b0 == 0xED ? 0x9F : b0 == 0xF4 ? 0x8F : 0xBF;
  if (byte_at(1) < lowest || byte_at(1) > highest) return 1;
  return b0 >= 0xF0 && byte_at(2) >= 0x80 && byte_at(2) <= 0xBF ? 3 : 2;
}

// Source text as UTF-8.
std::string Decoded(Text bytes) {
  if (IsWellFormedUtf8(bytes)) return std::string(bytes);
  std::string text;
  const char* const end = bytes.data() + bytes.size();
  for (const char* at = bytes.data(); at < end;) {
    const DecodedChar c = DecodeUtf8(at, end);
    if (c.length != 0) {
      text.append(at, c.length);
      at += c.length;
    } else {
      text += kReplacement;
      at += OddLength(at, end);
    }
  }
  return text;
}

// Calls `fn(code_point, bytes)` for each character of well-formed text.
template <class Function>
void ForEachChar(Text text, Function&& fn) {
  const char* const end = text.data() + text.size();
  for (const char* at = text.data(); at < end;) {
    const DecodedChar c = DecodeUtf8(at, end);
    const uint32_t length = std::max(c.length, 1u);
    fn(c.code_point, Text(at, length));
    at += length;
  }
}

bool IsSpace(uint32_t code_point) { return (CharClassOf(code_point) & kCharSpace) != 0; }

// Without white space at both ends.
Text Stripped(Text text) {
  size_t begin = text.size();
  size_t end = 0;
  ForEachChar(text, [&](uint32_t c, Text bytes) {
    if (IsSpace(c)) return;
    const auto at = static_cast<size_t>(bytes.data() - text.data());
    begin = std::min(begin, at);
    end = at + bytes.size();
  });
  return begin < end ? text.substr(begin, end - begin) : Text();
}

// The parts of a line that are looked at: more characters than are shown, whatever these take, and bounded, since a
// line may hold any number of statements.
constexpr size_t kMostBytes = 4 * (kWindow + 2);

Text FirstBytes(Text line) {
  size_t size = std::min(line.size(), kMostBytes);
  while (size > 0 && size < line.size() && !IsUtf8LeadByte(line[size])) --size;
  return line.substr(0, size);
}

Text LastBytes(Text line) {
  size_t begin = line.size() - std::min(line.size(), kMostBytes);
  while (begin > 0 && begin < line.size() && !IsUtf8LeadByte(line[begin])) ++begin;
  return line.substr(begin);
}

// The first `count` characters of well-formed text.
Text FirstChars(Text text, size_t count) {
  size_t at = 0;
  for (; at < text.size(); ++at) {
    if (IsUtf8LeadByte(text[at]) && count-- == 0) break;
  }
  return text.substr(0, at);
}

Text LastChars(Text text, size_t count) {
  size_t at = text.size();
  while (at > 0 && count > 0) count -= IsUtf8LeadByte(text[--at]);
  return text.substr(at);
}

class TextLinesWriter : public FileWriter {
 public:
  explicit TextLinesWriter(const TextLinesOptions& options) : options_(options) {}

  void Write(const BatchInput& input, const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
             std::string& out) override {
    path_.clear();
    AppendPrintable(input.path, path_);
    shown_line_ = kNoLine;
    placed.Begin(file, scopes);
    for (size_t row = 0; row < file.rows().size(); ++row) {
      file.CheckMemory(out.size());
      const size_t size_before = out.size();
      if (file.results()[row].error >= 0) {
        AppendError(file, row, out);
      } else if (!options_.errors_only) {
        AppendStatement(file, row, placed.OfRow(row), out);
      }
      CountSteps(static_cast<int64_t>(out.size() - size_before) / kBytesAStep);
    }
  }

 private:
  void AppendError(const FileAnalyzer& file, size_t row, std::string& out) {
    const Position position = file.ErrorPosition(row);
    const FileAnalyzer::Failure& error = file.errors()[static_cast<size_t>(file.results()[row].error)];
    place_.assign(path_).append(":").append(std::to_string(position.line + 1));
    place_.append(":").append(std::to_string(position.col + 1)).append(":");
    AppendColoured(kPlaceColour, place_, out);
    out += ' ';
    text_.clear();
    AppendPrintable(error.message(), text_);
    AppendColoured(kErrorColour, text_, out);

    const Text line = PhysicalLine(file.source(), static_cast<size_t>(position.line));
    const size_t column = std::min(static_cast<size_t>(position.col), line.size());
    std::string before = Decoded(LastBytes(line.substr(0, column)));
    std::string after = Decoded(FirstBytes(line.substr(column)));
    if (CharCountOfUtf8(before) + CharCountOfUtf8(after) > kWindow) {
      if (CharCountOfUtf8(before) > kWindow / 2) before = std::string(kEllipsis).append(LastChars(before, kWindow / 2));
      if (CharCountOfUtf8(after) > kWindow / 2) after = std::string(FirstChars(after, kWindow / 2)).append(kEllipsis);
    }
    text_.clear();
    AppendPrintable(before, text_);
    std::string caret;
    ForEachChar(text_, [&](uint32_t c, Text) { c == '\t' ? caret.append(1, '\t') : caret.append(WidthOf(c), ' '); });
    caret += '^';
    AppendPrintable(after, text_);
    out.append("\n    ").append(text_).append("\n    ");
    AppendColoured(kErrorColour, caret, out);
    out += '\n';
  }

  void AppendStatement(const FileAnalyzer& file, size_t row, std::span<const PlacedRecord> records, std::string& out) {
    if (records.empty()) return;
    const LineRow& line = file.rows()[row];
    place_.assign(path_).append(":").append(std::to_string(line.first_line + 1)).append(":");
    AppendColoured(kPlaceColour, place_, out);
    out += ' ';
    out += ShownLine(file.source(), line.first_line);
    if (line.last_line > line.first_line) out.append(" ").append(kEllipsis);
    out += '\n';
    for (const PlacedRecord& record : records) {
      text_.clear();
      AppendPrintable(record.name, text_);
      size_t width = 0;
      ForEachChar(text_, [&](uint32_t c, Text) { width += WidthOf(c); });
      out += "    ";
      AppendColoured(kNameColour, text_, out);
      out.append(width + 2 <= kNameWidth ? kNameWidth - width : 2, ' ');
      text_.clear();
      AppendDescription({record.kind, record.detail}, record.is_parameter, text_);
      AppendPrintable(text_, out);
      out += '\n';
    }
  }

  void AppendColoured(Text colour, Text text, std::string& out) const {
    if (options_.colours) {
      quillet::AppendColoured(colour, text, out);
    } else {
      out += text;
    }
  }

  // A physical line, counted from 0, without its end; empty past the last one.
  static Text PhysicalLine(const SourceText& source, size_t line) {
    const std::vector<uint32_t>& starts = source.line_starts;
    if (line >= starts.size()) return {};
    const size_t end = line + 1 < starts.size() ? starts[line + 1] : source.size();
    const Text text = source.text().substr(starts[line], end - starts[line]);
    return text.substr(0, text.find_last_not_of("\r\n") + 1);
  }

  // A physical line as it is shown: any number of statements may stand in one.
  const std::string& ShownLine(const SourceText& source, size_t line) {
    if (shown_line_ != line) {
      shown_line_ = line;
      shown_.clear();
      AppendSourceLine(PhysicalLine(source, line), shown_);
    }
    return shown_;
  }

  size_t WidthOf(uint32_t c) {
    if (c < 0x80 || !options_.width_of) return 1;
    const auto [found, added] = widths_.try_emplace(c, 0);
    if (added) found->second = options_.width_of(c);
    return found->second;
  }

  const TextLinesOptions options_;
  std::unordered_map<uint32_t, uint32_t> widths_;
  std::string path_;
  std::string place_;
  std::string text_;
  static constexpr size_t kNoLine = SIZE_MAX;
  size_t shown_line_ = kNoLine;
  std::string shown_;
};

}  // namespace

void AppendPrintable(Text text, std::string& out) {
  const char* const end = text.data() + text.size();
  const char* safe = text.data();
  for (const char* at = safe; at < end;) {
    const auto byte = static_cast<uint8_t>(*at);
    if (byte >= 0x20 && byte < 0x7F) [[likely]] {
      ++at;
      continue;
    }
    const DecodedChar c = DecodeUtf8(at, end);
    const uint32_t length = std::max(c.length, 1u);
    const uint32_t code_point = c.length != 0 ? c.code_point : 0xDC00 + byte;
    if (c.length == 0 || IsUnsafe(code_point)) {
      out.append(safe, at);
      AppendEscaped(code_point, out);
      safe = at + length;
    }
    at += length;
  }
  out.append(safe, end);
}

void AppendSourceLine(Text line, std::string& out) {
  const bool is_plain = std::all_of(line.begin(), line.end(), [](char c) { return c >= 0x20 && c < 0x7F; });
  if (is_plain) [[likely]] {
    line = line.substr(std::min(line.find_first_not_of(' '), line.size()));
    line = line.substr(0, line.find_last_not_of(' ') + 1);
    if (line.size() <= kWindow) {
      out += line;
    } else {
      out.append(line.substr(0, kWindow - 1)).append(kEllipsis);
    }
    return;
  }
  std::string text;
  const std::string decoded = Decoded(FirstBytes(line));
  AppendPrintable(Stripped(decoded), text);
  if (CharCountOfUtf8(text) > kWindow) {
    out.append(FirstChars(text, kWindow - 1)).append(kEllipsis);
  } else {
    out += text;
  }
}

void AppendColoured(Text colour, Text text, std::string& out) {
  if (!text.empty()) out.append("\x1b[").append(colour).append("m").append(text).append("\x1b[0m");
}

std::unique_ptr<FileWriter> MakeTextLinesWriter(const TextLinesOptions& options) {
  return std::make_unique<TextLinesWriter>(options);
}

}  // namespace quillet
