// Each word `from` in front of a path and `import` is taken for an import wherever it stands. What cannot be told for
// sure, such as what a broken import binds, makes the answer open.
#include "program/name_imports.h"

#include <utility>

#include "program/blanks.h"
#include "project/word_search.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

class ImportReader {
 public:
  ImportReader(Text source, Text word) : source_(source), word_(word) {}

  // Reads what stands behind a `from`: an import, or something else where no path and no `import` follow. False where
  // it is an import that is hard to read.
  bool Read(size_t behind_from) {
    at_ = behind_from;
    NameImport import;
    bool is_whole = true;
    for (SkipBlanks(); ByteAt(at_) == '.'; SkipBlanks()) {
      ++import.level;
      ++at_;
    }
    for (Text part = WordHere(); !part.empty() && part != kImport; part = WordHere()) {
      import.module += part;
      at_ += part.size();
      SkipBlanks();
      is_whole = ByteAt(at_) != '.';
      if (is_whole) break;
      import.module += '.';
      ++at_;
      SkipBlanks();
    }
    if (WordHere() != kImport) return true;
    if (!is_whole || (import.level == 0 && import.module.empty())) return false;
    path_ = {behind_from, at_};
    at_ += kImport.size();
    return ReadNames(import);
  }

  // Where the path of the import that was read last lies.
  std::pair<size_t, size_t> path() const { return path_; }

  std::vector<NameImport> found;

 private:
  static constexpr Text kImport = "import";

  char ByteAt(size_t at) const { return at < source_.size() ? source_[at] : '\n'; }

  Text WordHere() const {
    size_t end = at_;
    while (end < source_.size() && IsIdentifierByte(source_[end])) ++end;
    return source_.substr(at_, end - at_);
  }

  void SkipBlanks() {
    while (at_ < source_.size()) {
      if (IsBlank(source_[at_])) {
        ++at_;
      } else if (source_[at_] == '\\' && IsLineEnd(ByteAt(at_ + 1))) {
        at_ += source_.substr(at_ + 1, 2) == "\r\n" ? 3 : 2;
      } else {
        return;
      }
    }
  }

  // The names behind `import`, to the end of the line or of the bracket.
  bool ReadNames(const NameImport& import) {
    bool is_in_bracket = false;
    Text last;  // what `as` would rename
    for (SkipBlanks(); at_ < source_.size(); SkipBlanks()) {
      if (const Text name = WordHere(); !name.empty()) {
        at_ += name.size();
        if (name != "as") {
          last = name;
          if (name == word_) found.push_back({import.level, import.module, std::string(name)});
          continue;
        }
        SkipBlanks();
        if (WordHere() == word_) found.push_back({import.level, import.module, std::string(last)});
        at_ += WordHere().size();
        continue;
      }
      const char byte = source_[at_];
      if (byte == '*') {
        found.push_back({import.level, import.module, {}});
      } else if (byte == '(' && !is_in_bracket) {
        is_in_bracket = true;
      } else if (byte == '#' && is_in_bracket) {
        while (!IsLineEnd(ByteAt(at_ + 1))) ++at_;
      } else if (byte == ')' && is_in_bracket) {
        return true;
      } else if (IsLineEnd(byte) ? !is_in_bracket : byte == ';' || byte == '#' || byte == '"' || byte == '\'') {
        return !is_in_bracket;
      } else if (byte != ',' && !IsLineEnd(byte)) {
        return false;
      }
      ++at_;
    }
    return !is_in_bracket;
  }

  const Text source_;
  const Text word_;
  size_t at_ = 0;
  std::pair<size_t, size_t> path_;
};

// Whether a dot may end a line, in front of a comment or not; that is not known of lines that hold nothing else.
enum class LineEnd : uint8_t { kDot, kOther, kUnknown };
LineEnd EndOfLine(Text line) {
  while (!line.empty() && (IsBlank(line.back()) || line.back() == '\\')) line.remove_suffix(1);
  while (!line.empty() && IsBlank(line.front())) line.remove_prefix(1);
  if (line.empty() || line.front() == '#') return LineEnd::kUnknown;
  if (line.back() == '.') return LineEnd::kDot;
  for (size_t at = line.find('#'); at != Text::npos; at = line.find('#', at + 1)) {
    size_t before = at;
    while (before > 0 && IsBlank(line[before - 1])) --before;
    if (before > 0 && line[before - 1] == '.') return LineEnd::kDot;
  }
  return LineEnd::kOther;
}

// Whether a dot may stand in front of a word: on its line or, where it is the first one there, at the end of one above.
bool MayStandBehindDot(Text source, size_t at) {
  static constexpr int kMostLines = 100;
  while (at > 0 && IsBlank(source[at - 1])) --at;
  if (at == 0 || !IsLineEnd(source[at - 1])) return at > 0 && source[at - 1] == '.';
  for (int i = 0; at > 0; ++i) {
    size_t begin = --at;
    while (begin > 0 && !IsLineEnd(source[begin - 1])) --begin;
    const LineEnd end = i < kMostLines ? EndOfLine(source.substr(begin, at - begin)) : LineEnd::kDot;
    if (end != LineEnd::kUnknown) return end == LineEnd::kDot;
    at = begin;
  }
  return false;
}

}  // namespace

std::optional<std::vector<NameImport>> ImportsOfName(Text source, Text word) {
  static constexpr Text kFrom = "from";
  ImportReader imports(source, word);
  std::vector<std::pair<size_t, size_t>> paths;
  for (size_t at = FindWord(source, kFrom); at != Text::npos; at = FindWord(source, kFrom, at + kFrom.size())) {
    if (!imports.Read(at + kFrom.size())) return std::nullopt;
    if (paths.empty() || imports.path() != paths.back()) paths.push_back(imports.path());
  }
  auto path = paths.begin();
  for (size_t at = FindWord(source, word); at != Text::npos; at = FindWord(source, word, at + word.size())) {
    while (path != paths.end() && path->second <= at) ++path;
    const bool is_in_path = path != paths.end() && path->first <= at;
    if (!is_in_path && MayStandBehindDot(source, at)) return std::nullopt;
  }
  return std::move(imports.found);
}

}  // namespace quillet
