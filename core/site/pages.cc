// Lines are written piece by piece: links where names stand, colours between them, plain text for the rest.
//
// An element a line, so that a page of many lines opens quickly: blocks of lines are laid out when they come
// into view, which the style sheet asks for.
#include "site/pages.h"

#include <algorithm>
#include <charconv>
#include <vector>

#include "foundations/utf8.h"
#include "output/json_lines.h"
#include "site/html_text.h"

namespace quillet {

namespace {

constexpr uint32_t kLinesOfBlock = 64;
// As much of a line stands in the script of a file's lines, in bytes.
constexpr size_t kMostBytesOfSnippet = 160;
// As far in front of a name the path of its module is looked for, in bytes.
constexpr uint32_t kMostBytesOfPath = 300;
// A page lists as many errors of one line.
constexpr size_t kMostErrorsOfLine = 20;

struct Colour {
  uint32_t begin, end;
  char letter;  // the class of its element
};

struct PageError {
  uint32_t line, column;  // from 0
  Text message;
};

bool IsHardKeyword(TokenCode code) {
  if (!IsWordCode(code)) return false;
  switch (code) {
    case word::kCast:
    case word::kCase:
    case word::kExec:
    case word::kMatch:
    case word::kPrint:
    case word::kType:
    case word::kUnderscore:
      return false;
    default:
      return true;
  }
}

// Words that are keywords at the front of a statement alone, where they are no name.
bool IsSoftKeyword(TokenCode code) {
  return code == word::kCase || code == word::kMatch || code == word::kType || code == word::kExec ||
         code == word::kPrint;
}

// The letter of a link's class, by role.
constexpr char kRoleLetters[] = "dwrcxikg";
static_assert(sizeof(kRoleLetters) == kNameRoleCount + 1);

Text KindWord(NameKind kind) {
  switch (kind) {
    case NameKind::kClass:
      return "class";
    case NameKind::kFunction:
      return "def";
    case NameKind::kTypeAlias:
      return "type";
    case NameKind::kParameter:
    case NameKind::kTypeParameter:
      return "param";
    default:
      return "";
  }
}

class SitePageWriter : public FileWriter {
 public:
  SitePageWriter(std::shared_ptr<const SiteIndex> index, Version version) : index_(std::move(index)), names_(version) {}

  void Write(const BatchInput&, const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
             std::string& out) override {
    const ShownPart shown(file.source());
    source_ = file.source().text();
    names_.Collect(file, shown);
    facts_.Collect(file, scopes, placed, shown);
    FindColours(file, shown);
    FindErrors(file, shown);
    out.append(kSitePageHeadSize, ' ');
    AppendOutline(out);
    AppendSource(shown, out);
    AppendHead(out.size() - kSitePageHeadSize, shown, out);
    AppendSnippets(shown, out);
  }

 private:
  static void AppendHead(size_t body_size, const ShownPart& shown, std::string& out) {
    std::string head;
    AppendDigits(body_size, head);
    head += shown.shown_lines() < shown.line_count() ? " first-lines"
            : shown.shows_whole_lines()              ? " whole"
                                                     : " cut-lines";
    out.replace(0, head.size(), head);
  }

  void FindColours(const FileAnalyzer& file, const ShownPart& shown) {
    colours_.clear();
    if (shown.shown_lines() == 0) return;
    const uint32_t limit = shown.ShownEndOf(shown.shown_lines() - 1);
    for (const LineRow& row : file.rows()) {
      const TokenSpan toks = TokenSpan(file.source().tokens).subspan(row.first_token, row.token_count);
      bool is_front = true;
      for (const Token& token : toks) {
        if (token.removed()) continue;
        char letter = 0;
        if (token.code == tok::STRING || (token.code == tok::ERRORTOKEN && token.length > 1))
          letter = 's';
        else if (token.code == tok::COMMENT)
          letter = 'c';
        else if (token.code == tok::NUMBER)
          letter = 'd';
        else if (IsHardKeyword(token.code) || (is_front && IsSoftKeyword(token.code)))
          letter = 'k';
        is_front = false;
        if (letter == 0) continue;
        const auto begin = static_cast<uint32_t>(token.text - source_.data());
        if (begin >= limit) return;
        colours_.push_back({begin, begin + token.length, letter});
      }
    }
  }

  void FindErrors(const FileAnalyzer& file, const ShownPart& shown) {
    errors_.clear();
    for (size_t row = 0; row < file.rows().size() && errors_.size() < file.errors().size(); ++row) {
      const int32_t index = file.results()[row].error;
      if (index < 0) continue;
      const Position at = file.ErrorPosition(row);
      const uint32_t line =
          std::min(static_cast<uint32_t>(std::max(at.line, 0)), std::max(shown.shown_lines(), 1u) - 1);
      errors_.push_back(
          {line, static_cast<uint32_t>(std::max(at.col, 0)), file.errors()[static_cast<size_t>(index)].message()});
    }
    std::stable_sort(errors_.begin(), errors_.end(),
                     [](const PageError& one, const PageError& two) { return one.line < two.line; });
  }

  // ---- the outline ----

  void AppendOutline(std::string& out) const {
    bool is_open = false;
    for (const SiteDefinition& definition : names_.definitions()) {
      const SiteOccurrence& occurrence = names_.occurrences()[definition.occurrence];
      const Text word = KindWord(occurrence.kind);
      if (word.empty() || occurrence.role != NameRole::kDefinition) continue;
      if (!is_open) out += "<nav class=\"outline\" aria-label=\"Outline\"><h2>Outline</h2><ul>\n";
      is_open = true;
      const auto depth =
          definition.scope.empty()
              ? 0
              : 1 + std::min<ptrdiff_t>(std::count(definition.scope.begin(), definition.scope.end(), '.'), 5);
      out += "<li class=\"d";
      AppendDigits(static_cast<uint64_t>(depth), out);
      out += "\"><a href=\"#L";
      AppendDigits(occurrence.line + 1, out);
      out.append("\"><i>").append(word).append("</i> ");
      AppendHtml(TextOf(occurrence), out);
      out += "</a></li>\n";
    }
    if (is_open) out += "</ul></nav>\n";
  }

  // ---- the source ----

  void AppendSource(const ShownPart& shown, std::string& out) {
    at_name_ = at_colour_ = 0;
    size_t at_error = 0;
    out += "<main class=\"source\">\n";
    for (uint32_t line = 0; line < shown.shown_lines(); ++line) {
      if (line % kLinesOfBlock == 0) out += line == 0 ? "<div>" : "</div><div>";
      const bool is_bad = at_error < errors_.size() && errors_[at_error].line == line;
      out += "<p id=\"L";
      AppendDigits(line + 1, out);
      out += is_bad ? "\" class=\"bad\"><a href=\"#L" : "\"><a href=\"#L";
      AppendDigits(line + 1, out);
      out += "\">";
      AppendDigits(line + 1, out);
      out += "</a>";
      const uint32_t end = shown.ShownEndOf(line);
      AppendPieces(shown.BeginOf(line), end, out);
      if (end < shown.EndOf(line)) {
        out += "<em> \xE2\x80\xA6 and ";
        AppendDigits(shown.EndOf(line) - end, out);
        out += " more bytes</em>";
      }
      out += "</p>\n";
      for (size_t listed = 0; at_error < errors_.size() && errors_[at_error].line == line; ++at_error) {
        if (++listed <= kMostErrorsOfLine) AppendError(errors_[at_error], shown, out);
      }
    }
    if (shown.shown_lines() != 0) out += "</div>\n";
    if (shown.shown_lines() < shown.line_count()) {
      out += "<p class=\"rest\"><em>\xE2\x80\xA6 and ";
      AppendDigits(shown.line_count() - shown.shown_lines(), out);
      out += " more lines, which a page does not show</em></p>\n";
    }
    out += "</main>\n";
  }

  void AppendPieces(uint32_t begin, uint32_t end, std::string& out) {
    uint32_t at = begin;
    const std::span<const SiteOccurrence> names = names_.occurrences();
    for (; at_name_ < names.size() && names[at_name_].begin < end; ++at_name_) {
      const SiteOccurrence& occurrence = names[at_name_];
      if (occurrence.begin < at || occurrence.begin + occurrence.size > end) continue;
      if (!FindLink(occurrence)) continue;
      AppendColoured(at, occurrence.begin, out);
      AppendLink(occurrence, out);
      at = occurrence.begin + occurrence.size;
    }
    AppendColoured(at, end, out);
  }

  void AppendColoured(uint32_t at, uint32_t end, std::string& out) {
    while (at < end) {
      while (at_colour_ < colours_.size() && colours_[at_colour_].end <= at) ++at_colour_;
      if (at_colour_ == colours_.size() || colours_[at_colour_].begin >= end) break;
      const Colour& colour = colours_[at_colour_];
      const uint32_t from = std::max(colour.begin, at);
      const uint32_t to = std::min(colour.end, end);
      AppendHtml(source_.substr(at, from - at), out);
      out.append("<b class=\"").append(1, colour.letter).append("\">");
      AppendHtml(source_.substr(from, to - from), out);
      out += "</b>";
      at = to;
    }
    AppendHtml(source_.substr(at, end - at), out);
  }

  // Works out where a name leads; false for one that nothing defines.
  bool FindLink(const SiteOccurrence& occurrence) {
    link_ = {};
    link_.line = occurrence.line;
    link_.facts = facts_.At(occurrence.begin);
    const bool is_variable = occurrence.variable != kNoIndex;
    if (is_variable) {
      const uint32_t definition = names_.DefinitionOf(occurrence.variable);
      if (definition != kNoIndex) link_.line = names_.occurrences()[definition].line;
    }
    if (!names_.IsShared(occurrence)) return true;
    if (occurrence.role == NameRole::kImport) {
      if (const Text module = ModulePath(occurrence); !module.empty()) link_.file = index_->FileOfModule(module);
      if (link_.file != SiteIndex::kNone) link_.line = kNoIndex;
    }
    link_.name = index_->Find(TextOf(occurrence));
    // A star import may have brought what other files define.
    if (is_variable && names_.DefinitionOf(occurrence.variable) == kNoIndex &&
        (link_.name == SiteIndex::kNone || index_->name(link_.name).definitions == 0))
      return false;
    if (link_.file != SiteIndex::kNone) return true;
    const uint32_t imported = is_variable ? occurrence.variable : occurrence.receiver;
    const bool is_imported = imported != kNoIndex && names_.IsImported(imported);
    if (link_.name == SiteIndex::kNone || !(is_imported || occurrence.is_attribute)) return true;
    const Text module = is_imported ? ModuleOf(imported) : Text();
    const SiteIndex::Name* name = index_->OnlyDefinition(link_.name, module, occurrence.is_attribute);
    if (name == nullptr) return true;
    link_.file = name->file;
    link_.line = name->line;
    return true;
  }

  // The path of a module up to this name, without the dots in front of a relative one; empty for a name that is
  // imported from a module.
  Text ModulePath(const SiteOccurrence& occurrence) const {
    const auto is_of_path = [](char c) {
      return c == '.' || static_cast<uint8_t>(c) >= 0x80 ||
             (AsciiClassOf(c) & (kAsciiAlpha | kAsciiDigit | kAsciiUnderscore)) != 0;
    };
    const uint32_t least = occurrence.begin - std::min(occurrence.begin, kMostBytesOfPath);
    uint32_t begin = occurrence.begin;
    while (begin > least && is_of_path(source_[begin - 1])) --begin;
    Text before = source_.substr(least, begin - least);
    before = before.substr(0, before.find_last_not_of(" \t\\\r\n") + 1);
    if (!before.ends_with("from")) {
      const size_t line = source_.find_last_of('\n', occurrence.begin) + 1;
      const Text statement = source_.substr(std::min(source_.find_first_not_of(" \t", line), size_t{begin}));
      if (!statement.starts_with("import ")) return {};
    }
    while (source_[begin] == '.') ++begin;
    return source_.substr(begin, occurrence.begin + occurrence.size - begin);
  }

  // The module that a variable is imported from; empty where that is not known.
  Text ModuleOf(uint32_t variable) const {
    const uint32_t definition = names_.DefinitionOf(variable);
    return definition != kNoIndex ? facts_.ModuleAt(names_.occurrences()[definition].begin) : Text();
  }

  void AppendLink(const SiteOccurrence& occurrence, std::string& out) const {
    out += "<a class=\"";
    out += kRoleLetters[static_cast<size_t>(occurrence.role)];
    if (occurrence.role == NameRole::kDefinition) {
      if (const Text word = KindWord(occurrence.kind); !word.empty()) out.append(" ").append(word);
    }
    out += "\" href=\"";
    if (link_.file != SiteIndex::kNone) {
      AppendDigits(link_.file, out);
      out += ".html";
    }
    if (link_.line != kNoIndex) {
      out += "#L";
      AppendDigits(link_.line + 1, out);
    }
    if (occurrence.variable != kNoIndex) {
      out += "\" data-s=\"";
      AppendDigits(occurrence.variable, out);
    }
    if (link_.name != SiteIndex::kNone) {
      out += "\" data-n=\"";
      AppendDigits(link_.name, out);
    }
    if (!link_.facts.empty()) {
      out += "\" data-tip=\"";
      AppendHtml(link_.facts, out);
    }
    out += "\">";
    AppendHtml(TextOf(occurrence), out);
    out += "</a>";
  }

  // A row below the line, with a caret under the column: the text in front of it, in blanks.
  void AppendError(const PageError& error, const ShownPart& shown, std::string& out) const {
    const uint32_t begin = shown.BeginOf(error.line);
    const uint32_t end = std::min(begin + error.column, shown.ShownEndOf(error.line));
    out += "<p class=\"error\">";
    for (const char c : source_.substr(begin, end - begin)) {
      if (IsUtf8LeadByte(c)) out += c == '\t' ? '\t' : ' ';
    }
    out += "^ ";
    AppendHtml(error.message, out);
    out += "</p>\n";
  }

  // ---- the lines as a script ----

  void AppendSnippets(const ShownPart& shown, std::string& out) const {
    out += "quillet.take([";
    for (uint32_t line = 0; line < shown.shown_lines(); ++line) {
      Text text = source_.substr(shown.BeginOf(line), shown.ShownEndOf(line) - shown.BeginOf(line));
      text.remove_prefix(std::min(text.find_first_not_of(" \t\f"), text.size()));
      size_t size = std::min(text.size(), kMostBytesOfSnippet);
      while (size > 0 && size < text.size() && !IsUtf8LeadByte(text[size])) --size;
      out += line == 0 ? "\n" : ",\n";
      AppendJsonString(text.substr(0, size), out);
    }
    out += "]);\n";
  }

  Text TextOf(const SiteOccurrence& occurrence) const { return source_.substr(occurrence.begin, occurrence.size); }

  struct Link {
    uint32_t file = SiteIndex::kNone;  // kNone for the page itself
    uint32_t line = 0;                 // kNoIndex for the page as a whole
    uint32_t name = SiteIndex::kNone;
    Text facts;
  };

  const std::shared_ptr<const SiteIndex> index_;
  SiteOccurrences names_;
  SiteFacts facts_;
  Text source_;
  std::vector<Colour> colours_;
  std::vector<PageError> errors_;
  size_t at_name_ = 0;    // the first name that no line has shown yet
  size_t at_colour_ = 0;  // the first colour that does not end in front of what was written
  Link link_;
};

}  // namespace

std::unique_ptr<FileWriter> MakeSitePageWriter(std::shared_ptr<const SiteIndex> index, Version version) {
  return std::make_unique<SitePageWriter>(std::move(index), version);
}

}  // namespace quillet
