// Constant pieces of text with numbers and escaped strings between them.
#include "output/json_lines.h"

#include <array>
#include <charconv>

#include "foundations/stop.h"
#include "foundations/utf8.h"

namespace quillet {

namespace {

constexpr char kDigits[] = "0123456789abcdef";

// The letter behind the backslash of a short escape; 'u' where a character has only the long one; 0
// where it stands for itself.
constexpr std::array<char, 256> kEscapes = [] {
  std::array<char, 256> escapes{};
  for (int c = 0; c < 256; ++c) escapes[c] = c < 0x20 || c >= 0x7F ? 'u' : '\0';
  escapes['"'] = '"';
  escapes['\\'] = '\\';
  escapes['\n'] = 'n';
  escapes['\r'] = 'r';
  escapes['\t'] = 't';
  escapes['\f'] = 'f';
  escapes['\b'] = 'b';
  return escapes;
}();

void AppendUnit(uint32_t unit, std::string& out) {
  const char escape[] = {
      '\\', 'u', kDigits[unit >> 12 & 15], kDigits[unit >> 8 & 15], kDigits[unit >> 4 & 15], kDigits[unit & 15]};
  out.append(escape, sizeof(escape));
}

// Appends the escape of the character at `at` and gives the byte behind it.
const char* AppendEscape(const char* at, const char* end, std::string& out) {
  const char letter = kEscapes[static_cast<uint8_t>(*at)];
  if (letter != 'u') {
    out.append(1, '\\').append(1, letter);
    return at + 1;
  }
  const DecodedChar c = DecodeUtf8(at, end);
  if (c.length == 0) {
    AppendUnit(0xDC00 + static_cast<uint8_t>(*at), out);
    return at + 1;
  }
  if (c.code_point < 0x10000) {
    AppendUnit(c.code_point, out);
  } else {
    AppendUnit(0xD800 + ((c.code_point - 0x10000) >> 10), out);
    AppendUnit(0xDC00 + ((c.code_point - 0x10000) & 0x3FF), out);
  }
  return at + c.length;
}

void AppendNumber(uint64_t number, std::string& out) {
  char digits[20];
  out.append(digits, std::to_chars(digits, digits + sizeof(digits), number).ptr);
}

Text TruthText(bool truth) { return truth ? "true" : "false"; }

class JsonLinesWriter : public FileWriter {
 public:
  explicit JsonLinesWriter(const JsonLinesOptions& options) : options_(options) {}

  void Write(const BatchInput& input, const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
             std::string& out) override {
    front_ = R"({"type":"line","path":)";
    AppendJsonString(input.path, front_);
    front_ += R"(,"first_line":)";
    scopes_.clear();
    for (const Text name : scopes.names()) {
      std::string& quoted = scopes_.emplace_back();
      AppendJsonString(name, quoted);
    }
    placed.Begin(file, scopes);
    for (size_t row = 0; row < file.rows().size(); ++row) {
      file.CheckMemory(out.size());
      const size_t size_before = out.size();
      const FileAnalyzer::LineResult& result = file.results()[row];
      const bool has_records =
          result.record_begin != result.record_end || result.arg_record_begin != result.arg_record_end;
      if (result.error < 0 && (options_.errors_only || !has_records)) continue;
      AppendHead(file.rows()[row], result, out);
      AppendRecords(placed.OfRow(row), out);
      if (result.error >= 0) AppendError(file, row, out);
      out += "}\n";
      CountSteps(static_cast<int64_t>(out.size() - size_before) / kBytesAStep);
    }
  }

 private:
  void AppendHead(const LineRow& row, const FileAnalyzer::LineResult& result, std::string& out) const {
    out += front_;
    AppendNumber(uint64_t{row.first_line} + 1, out);
    out += R"(,"last_line":)";
    AppendNumber(uint64_t{row.last_line} + 1, out);
    out += R"(,"indent":)";
    AppendNumber(row.indent, out);
    out.append(R"(,"kind":")").append(TextOfLineKind(row.kind));
    out.append(R"(","in_async_def":)").append(TruthText(result.in_async_def));
    out.append(R"(,"first_in_def":)").append(TruthText(result.first_in_def));
  }

  void AppendRecords(std::span<const PlacedRecord> records, std::string& out) const {
    out += R"(,"records":[)";
    for (const PlacedRecord& record : records) {
      out += &record == records.data() ? R"({"name":)" : R"(,{"name":)";
      AppendJsonString(record.name, out);
      out.append(R"(,"kind":")").append(RecordKindWords()[static_cast<size_t>(record.kind)]);
      out += R"(","detail":)";
      AppendJsonString(record.detail, out);
      out.append(R"(,"is_parameter":)").append(TruthText(record.is_parameter));
      out += R"(,"line":)";
      AppendNumber(record.line, out);
      out += R"(,"column":)";
      AppendNumber(record.column, out);
      out.append(R"(,"scope":)").append(scopes_[record.scope]);
      out += '}';
    }
    out += ']';
  }

  static void AppendError(const FileAnalyzer& file, size_t row, std::string& out) {
    const Position position = file.ErrorPosition(row);
    out += R"(,"error":{"message":)";
    AppendJsonString(file.errors()[static_cast<size_t>(file.results()[row].error)].message(), out);
    out += R"(,"line":)";
    AppendNumber(static_cast<uint64_t>(position.line) + 1, out);
    out += R"(,"column":)";
    AppendNumber(static_cast<uint64_t>(position.col) + 1, out);
    out += '}';
  }

  const JsonLinesOptions options_;
  std::string front_;                // of a statement's line, up to its first number
  std::vector<std::string> scopes_;  // as JSON strings
};

}  // namespace

void AppendJsonString(Text text, std::string& out) {
  const char* const end = text.data() + text.size();
  const char* plain = text.data();
  out += '"';
  for (const char* at = plain; at < end;) {
    if (kEscapes[static_cast<uint8_t>(*at)] == '\0') [[likely]] {
      ++at;
      continue;
    }
    out.append(plain, at);
    plain = at = AppendEscape(at, end, out);
  }
  out.append(plain, end);
  out += '"';
}

std::unique_ptr<FileWriter> MakeJsonLinesWriter(const JsonLinesOptions& options) {
  return std::make_unique<JsonLinesWriter>(options);
}

}  // namespace quillet
