// Lines, and behind them the number of their places.
#include "index/answer_lines.h"

#include <charconv>

#include "foundations/shown_text.h"
#include "index/bytes.h"
#include "output/json_lines.h"
#include "output/text_lines.h"

namespace quillet {

namespace {

constexpr size_t kCountSize = 8;

void AppendDecimal(uint64_t number, std::string& out) {
  char digits[20];
  out.append(digits, std::to_chars(digits, digits + sizeof(digits), number).ptr);
}

Text TruthWord(bool truth) { return truth ? "true" : "false"; }

class AnswerLinesFormat : public AnswerFormat {
 public:
  explicit AnswerLinesFormat(const AnswerLinesOptions& options) : options_(options) {}

  void Write(const BatchInput& input, const SourceText& source, std::span<const Answer> answers,
             std::string& out) override {
    using Form = AnswerLinesOptions::Form;
    SetPath(input.path);
    uint64_t places = 0;
    const Answer* before = nullptr;
    for (const Answer& answer : answers) {
      const bool is_new_line = before == nullptr || before->line != answer.line;
      const bool is_new_place = is_new_line || before->column != answer.column;
      before = &answer;
      places += is_new_place;
      if (options_.form == Form::kNone) continue;
      if (is_new_line) SetLine(SourceLineOf(source, answer));
      if (options_.form == Form::kJson) {
        AppendJson(answer, out);
      } else {
        if (is_new_place) AppendPlace(answer, out);
        if (options_.form == Form::kLong) AppendDetail(answer, out);
      }
    }
    AppendFixed(places, out);
  }

 private:
  bool is_json() const { return options_.form == AnswerLinesOptions::Form::kJson; }

  void SetPath(Text path) {
    if (path.starts_with(options_.folder)) path.remove_prefix(options_.folder.size());
    path_.clear();
    if (is_json()) {
      AppendJsonString(path, path_);
    } else {
      AppendPrintable(path, path_);
    }
  }

  // As it is shown: many answers stand in one line.
  void SetLine(Text line) {
    line_.clear();
    if (is_json()) {
      AppendJson(line, line_);
    } else {
      AppendSourceLine(line, line_);
    }
  }

  void AppendPlace(const Answer& answer, std::string& out) {
    text_.assign(path_).append(":");
    AppendDecimal(answer.line, text_);
    text_ += ':';
    AppendDecimal(answer.column, text_);
    text_ += ':';
    AppendMaybeColoured(kPlaceColour, text_, out);
    if (!line_.empty()) out.append(" ").append(line_);
    out += '\n';
  }

  // Kinds that no record has are told by what the occurrence does.
  void AppendDetail(const Answer& answer, std::string& out) {
    out += "    ";
    text_.clear();
    AppendPrintable(Shown(answer.name), text_);
    AppendMaybeColoured(kNameColour, text_, out);
    out += "  ";
    if (answer.kind == RecordKind::kCalled && answer.detail.empty()) {
      out += "called";
    } else if (answer.kind == RecordKind::kImport && answer.detail.empty()) {
      out += "imported";
    } else if (!answer.is_record && answer.kind == RecordKind::kOther) {
      out += PhraseOf(static_cast<NameRole>(answer.role - 1));
    } else {
      text_.clear();
      AppendDescription({answer.kind, answer.detail}, answer.is_parameter, text_);
      AppendPrintable(Shown(text_), out);
    }
    if (!answer.scope.empty()) {
      out += "  in ";
      AppendPrintable(Shown(answer.scope), out);
    }
    out += '\n';
  }

  void AppendJson(const Answer& answer, std::string& out) {
    out.append(R"({"type":"record","path":)").append(path_).append(R"(,"line":)");
    AppendDecimal(answer.line, out);
    out += R"(,"column":)";
    AppendDecimal(answer.column, out);
    out += R"(,"scope":)";
    AppendJson(answer.scope, out);
    out += R"(,"name":)";
    AppendJson(answer.name, out);
    out.append(R"(,"kind":")").append(KindWordOf(answer)).append(R"(","detail":)");
    AppendJson(answer.detail, out);
    out.append(R"(,"is_parameter":)").append(TruthWord(answer.is_parameter));
    out.append(R"(,"source":)").append(line_).append(R"(,"changed":false,"role":)");
    if (answer.role == 0) {
      out += "null";
    } else {
      out.append("\"").append(NameRoleWords()[answer.role - 1u]).append("\"");
    }
    out += R"(,"flags":[)";
    const char* separator = "\"";
    for (size_t bit = 0; bit < NameFlagWords().size(); ++bit) {
      if ((answer.flags >> bit & 1) == 0) continue;
      out.append(separator).append(NameFlagWords()[bit]).append("\"");
      separator = ",\"";
    }
    out += R"(],"receiver":)";
    if (const size_t dot = answer.name.rfind('.'); dot != Text::npos) {
      AppendJson(answer.name.substr(0, dot), out);
    } else {
      out += "null";
    }
    out += "}\n";
  }

  void AppendJson(Text text, std::string& out) { AppendJsonString(Shown(text), out); }

  void AppendMaybeColoured(Text colour, Text text, std::string& out) const {
    if (options_.colours) {
      AppendColoured(colour, text, out);
    } else {
      out += text;
    }
  }

  // Bytes that are part of no character are spelt out. It stands until the next call.
  Text Shown(Text text) {
    if (IsWellFormedUtf8(text)) [[likely]]
      return text;
    shown_.clear();
    AppendShown(text, shown_);
    return shown_;
  }

  static Text PhraseOf(NameRole role) {
    switch (role) {
      case NameRole::kDelete:
        return "deleted";
      case NameRole::kKeyword:
        return "passed as a keyword";
      default:
        return "declared";
    }
  }

  const AnswerLinesOptions options_;
  std::string path_;
  std::string line_;
  std::string text_;
  std::string shown_;
};

}  // namespace

std::unique_ptr<AnswerFormat> MakeAnswerLines(const AnswerLinesOptions& options) {
  return std::make_unique<AnswerLinesFormat>(options);
}

std::optional<AnswerLines> ReadAnswerLines(Text written) {
  if (written.size() < kCountSize) return std::nullopt;
  const size_t size = written.size() - kCountSize;
  return AnswerLines{ByteReader(written.substr(size)).Fixed(), written.substr(0, size)};
}

}  // namespace quillet
