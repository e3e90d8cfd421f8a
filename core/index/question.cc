// A pass over the placed records of a file; and the words of a question.
#include "index/question.h"

#include <algorithm>
#include <unordered_map>

#include "foundations/utf8.h"
#include "index/bytes.h"

namespace quillet {

namespace {

// As much of a source line as is handed on: an editor shows no more, and one line may hold any number of
// answers.
constexpr size_t kMaxLineSize = 4096;

bool IsWildcard(char c) { return c == '*' || c == '?'; }
bool IsPattern(Text text) { return std::any_of(text.begin(), text.end(), IsWildcard); }

// Whether a dotted text is a name or ends in it.
bool EndsInName(Text text, Text name) {
  if (!text.ends_with(name)) return false;
  return text.size() == name.size() || text[text.size() - name.size() - 1] == '.';
}

// Whether a dotted name is one of the scope or of one around it: whole names one behind the other.
bool HoldsNames(Text scope, Text wanted) {
  // The scope of the module is within itself alone.
  if (wanted.empty()) return scope.empty();
  for (size_t at = scope.find(wanted); at != Text::npos; at = scope.find(wanted, at + 1)) {
    const size_t end = at + wanted.size();
    if ((at == 0 || scope[at - 1] == '.') && (end == scope.size() || scope[end] == '.')) return true;
  }
  return false;
}

// ---- which records answer ----

class Matcher {
 public:
  explicit Matcher(const Question& question) : question_(question) {
    name_ = question.name;
    if (question.match == Question::Match::kSuffix && name_.starts_with('.')) name_.remove_prefix(1);
    is_dotted_suffix_ = name_.size() != question.name.size();
    scope_of_name_ = question.name;
    scope_of_name_.remove_prefix(std::min(scope_of_name_.find_first_not_of('.'), scope_of_name_.size()));
    const size_t dot = question.name.rfind('.');
    if (question.match == Question::Match::kExact && dot != std::string::npos) {
      outer_ = Text(question.name).substr(0, dot);
      member_ = Text(question.name).substr(dot + 1);
      has_member_ = true;
    }
    scope_is_pattern_ = IsPattern(question.scope);
    last_name_ = question.name;
    last_name_.remove_prefix(question.name.rfind('.') + 1);
  }

  bool Takes(const PlacedRecord& record, Text scope) const {
    if (question_.match == Question::Match::kEverything) return true;
    return TakesName(record, scope) && TakesScope(scope);
  }

  // Whether an occurrence has the name; its dotted name goes to `name` then, and may else.
  bool HasName(uint32_t index, const Bindings& bindings, std::string& name) const {
    const Text last = bindings.TextOf(bindings.occurrences[index]);
    if (question_.match != Question::Match::kGlob && last != last_name_) return false;
    AppendDotted(index, bindings, name);
    return IsName(name);
  }

  bool TakesScope(Text scope) const {
    if (!question_.has_scope) return true;
    return scope_is_pattern_ ? FitsGlob(scope, question_.scope) : HoldsNames(scope, question_.scope);
  }

 private:
  bool TakesName(const PlacedRecord& record, Text scope) const {
    if ((question_.uses & UseOf(record)) != 0) {
      if (IsName(record.name)) return true;
      if (record.kind == RecordKind::kFromImport && IsImportedBy(record.detail)) return true;
      if (has_member_ && record.kind == RecordKind::kSet && !record.is_parameter && record.name == member_ &&
          EndsInName(scope, outer_))
        return true;
    }
    return question_.returns && (record.name == "return" || record.name == "yield") && IsScopeOfName(scope);
  }

  bool IsName(Text text) const {
    switch (question_.match) {
      case Question::Match::kExact:
        return text == name_;
      case Question::Match::kSuffix:
        // Behind a dot nothing is the name itself.
        return EndsInName(text, name_) && !(is_dotted_suffix_ && text.size() == name_.size());
      case Question::Match::kGlob:
        return FitsGlob(text, name_);
      case Question::Match::kEverything:
        break;
    }
    return true;
  }

  // Whether the name is that of a module and of what is imported from it, which the detail has with a blank
  // between them. Dots in front of a module say where it lies, and need not be asked for.
  bool IsImportedBy(Text detail) const {
    const size_t blank = detail.rfind(' ');
    if (!has_member_ || blank == Text::npos || detail.substr(blank + 1) != member_) return false;
    const Text module = detail.substr(0, blank);
    return module == outer_ || module.substr(std::min(module.find_first_not_of('.'), module.size())) == outer_;
  }

  bool IsScopeOfName(Text scope) const {
    return question_.match == Question::Match::kGlob ? FitsGlob(scope, name_) : EndsInName(scope, scope_of_name_);
  }

  static void AppendDotted(uint32_t index, const Bindings& bindings, std::string& name) {
    chain_.clear();
    uint32_t at = index;
    while (at != kNoIndex && chain_.size() < kMostChained) {
      chain_.push_back(at);
      at = bindings.ReceiverOf(at);
    }
    name.clear();
    if (at != kNoIndex || bindings.occurrences[chain_.back()].is_attribute) name += '.';
    for (size_t i = chain_.size(); i-- > 0;) {
      if (i + 1 != chain_.size()) name += '.';
      name += bindings.TextOf(bindings.occurrences[chain_[i]]);
    }
  }

  // Names of a longer chain are known by their ends.
  static constexpr size_t kMostChained = 64;
  static thread_local std::vector<uint32_t> chain_;

  const Question& question_;
  Text last_name_;
  Text name_;
  bool is_dotted_suffix_ = false;
  Text scope_of_name_;
  bool has_member_ = false;
  Text outer_, member_;
  bool scope_is_pattern_ = false;
};

thread_local std::vector<uint32_t> Matcher::chain_;

// The kind of record that tells what an occurrence does.
RecordKind KindOf(const Occurrence& occurrence) {
  switch (occurrence.role) {
    case NameRole::kDefinition:
    case NameRole::kWrite:
      return RecordKind::kSet;
    case NameRole::kCall:
      return RecordKind::kCalled;
    case NameRole::kImport:
      return RecordKind::kImport;
    case NameRole::kRead:
      return RecordKind::kGet;
    case NameRole::kDelete:
    case NameRole::kKeyword:
    case NameRole::kDeclaration:
      break;
  }
  return RecordKind::kOther;
}

// ---- which statements can hold an answer ----

// Those that hold the last word of the name. So do those that bring others to it: a declaration moves records from
// scope to scope, and a comment with types may be about names of the statement in front of it.
class StatementsWithWord : public RowFilter {
 public:
  explicit StatementsWithWord(const Question& question) {
    const Text name = question.name;
    const Text last = name.substr(name.rfind('.') + 1);
    const bool is_plain = !last.empty() && std::all_of(last.begin(), last.end(), IsWordByte);
    const bool has_word = question.match == Question::Match::kExact || question.match == Question::Match::kSuffix;
    // What a function returns has a name that its head does not spell.
    const bool is_spelled = last != "return" && last != "yield";
    if (is_plain && has_word && is_spelled && !question.returns) word_ = last;
    is_name_alone_ = question.match == Question::Match::kExact && last.size() == name.size();
  }

  bool Choose(const SourceText& source, std::span<const LineRow> rows, std::vector<bool>& wanted) override {
    constexpr Text kNonlocal = "nonlocal";
    if (word_.empty() || rows.empty()) return false;
    // Where such a name is bound may be told by any statement that holds it, which need not hold the last word.
    if (!is_name_alone_ && source.text().find(kNonlocal) != Text::npos) return false;
    for (const Text text : {Text(word_), Text("global"), kNonlocal, Text("type:")}) Mark(text, source, rows, wanted);
    return true;
  }

 private:
  static void Mark(Text wanted_text, const SourceText& source, std::span<const LineRow> rows,
                   std::vector<bool>& wanted) {
    const Text text = source.text();
    const auto begin_of = [&](size_t row) { return source.tokens[rows[row].first_token].text; };
    size_t row = 0;
    for (size_t at = text.find(wanted_text); at != Text::npos;) {
      // The last row that begins in front of it.
      while (row + 1 < rows.size() && begin_of(row + 1) <= text.data() + at) ++row;
      wanted[row] = true;
      const size_t behind = row + 1 < rows.size() ? static_cast<size_t>(begin_of(row + 1) - text.data()) : text.size();
      at = text.find(wanted_text, behind);
    }
  }

  std::string word_;
  bool is_name_alone_ = false;
};

class QuestionWriter : public FileWriter {
 public:
  QuestionWriter(const Question& question, Version version, std::unique_ptr<AnswerFormat> format)
      : question_(question), matcher_(question_), filter_(question_), binder_(version), format_(std::move(format)) {}

  RowFilter* row_filter() override { return &filter_; }

  void Write(const BatchInput& input, const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
             std::string& out) override {
    answers_.clear();
    placed.Begin(file, scopes);
    for (size_t row = 0; row < file.rows().size(); ++row) {
      const FileAnalyzer::LineResult& result = file.results()[row];
      if (result.record_begin == result.record_end && result.arg_record_begin == result.arg_record_end) continue;
      for (const PlacedRecord& record : placed.OfRow(row)) {
        const Text scope = scopes.names()[record.scope];
        if (!matcher_.Takes(record, scope)) continue;
        answers_.push_back({record.line, record.column, scope, record.name, record.detail, record.kind,
                            record.is_parameter, OpensOf(file, scopes, row, record)});
      }
    }
    if (question_.match != Question::Match::kEverything) {
      SortAndUnite();
      AddOccurrences(file, scopes);
      std::erase_if(answers_, [](const Answer& answer) { return answer.line == 0; });
      if (answers_.size() != record_count_ || !moved_.empty()) SortAndUnite();
    }
    format_->Write(input, file.source(), answers_, out);
  }

 private:
  // What is set where the head of a class or a function has its name.
  static uint8_t OpensOf(const FileAnalyzer& file, const ScopeNames& scopes, size_t row, const PlacedRecord& record) {
    if (record.kind != RecordKind::kSet) return 0;
    const LineKind kind = file.rows()[row].kind;
    if (kind != LineKind::kClassDef && kind != LineKind::kFunctionDef) return 0;
    const uint32_t opened = scopes.ScopeOpenedBy(row);
    if (opened == ScopeNames::kNone) return 0;
    const LineRow& head = file.rows()[row];
    const Text own_name = scopes.scopes()[opened].own_name;
    const SourceText& source = file.source();
    const char* at = source.Holds(own_name.data()) ? own_name.data() : source.tokens[head.first_token].text;
    const Position place = source.PositionFrom(static_cast<int32_t>(head.first_line), at);
    if (static_cast<uint32_t>(place.line) + 1 != record.line || static_cast<uint32_t>(place.col) + 1 != record.column)
      return 0;
    return kind == LineKind::kClassDef ? 1 : 2;
  }

  // The occurrences of the name, each as an answer of its own where no record tells of it.
  void AddOccurrences(const FileAnalyzer& file, const ScopeNames& scopes) {
    // Where a record told of what, to the first of its answers; names are those of the question.
    told_.clear();
    told_behind_.clear();
    copies_.clear();
    texts_.Reset();
    const SourceText& source = file.source();
    for (uint32_t i = 0; i < answers_.size(); ++i) {
      told_.try_emplace(PlaceOf(answers_[i]), i);
      const Text name = answers_[i].name;
      if (name.find_first_of(kTrailers) == Text::npos) continue;
      if (source.Holds(name.data())) {
        const size_t last = name.rfind('.') + 1;
        told_behind_.try_emplace(static_cast<uint32_t>(name.data() + last - source.begin()), i);
      } else {
        copies_.push_back(i);
      }
    }
    record_count_ = answers_.size();
    moved_.clear();
    const Bindings& bindings = binder_.Bind(source, file.rows());
    const std::span<const LineRow> rows = file.rows();
    size_t row = 0;
    for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
      const Occurrence& occurrence = bindings.occurrences[i];
      const char* const at = source.begin() + occurrence.begin;
      while (row + 1 < rows.size() && source.tokens[rows[row + 1].first_token].text <= at) ++row;
      if (!matcher_.HasName(i, bindings, name_)) continue;
      uint32_t root = i;
      for (uint32_t next = i; next != kNoIndex; next = bindings.ReceiverOf(next)) root = next;
      const Position place = bindings.PositionOf(bindings.occurrences[root].begin);
      Answer answer;
      answer.line = static_cast<uint32_t>(place.line) + 1;
      answer.column = static_cast<uint32_t>(place.col) + 1;
      answer.role = static_cast<uint8_t>(occurrence.role) + 1;
      answer.flags = static_cast<uint8_t>(occurrence.flags);
      answer.name = name_;
      const bool is_wanted = (question_.uses & UsesOf(occurrence, bindings, source)) != 0;
      if (TellRole(answer, is_wanted) || TellRoleBehind(source, occurrence.begin, rows[row], answer) || !is_wanted)
        continue;
      answer.is_parameter = occurrence.kind == NameKind::kParameter;
      answer.scope = scopes.names()[ScopeAt(bindings.occurrences[root], answer.is_parameter, bindings, scopes, row)];
      if (!matcher_.TakesScope(answer.scope)) continue;
      answer.kind = KindOf(occurrence);
      answer.is_record = false;
      answer.name = texts_.Copy(name_);
      answers_.push_back(answer);
    }
    for (const Move& move : moved_) {
      answers_[move.answer].line = move.line;
      answers_[move.answer].column = move.column;
    }
  }

  // Gives the records of an occurrence its role; false where there are none. Records call a bare decorator
  // a call, which it is only when the definition is done, so where calls are asked for it is none.
  bool TellRole(const Answer& occurrence, bool is_wanted) {
    const auto found = told_.find(PlaceOf(occurrence));
    bool told = false;
    for (size_t i = found != told_.end() ? found->second : record_count_;
         i < record_count_ && PlaceOf(answers_[i]) == PlaceOf(occurrence); ++i) {
      if (answers_[i].name != occurrence.name) continue;
      answers_[i].role = occurrence.role;
      answers_[i].flags = occurrence.flags;
      const bool is_call = occurrence.role == static_cast<uint8_t>(NameRole::kCall) + 1;
      if (!is_wanted && !is_call && answers_[i].kind == RecordKind::kCalled) answers_[i].line = 0;
      told = true;
    }
    return told;
  }

  // The same for records of what stands behind a call or a subscript, which have the text of that in their name: they
  // are moved to where the names begin. A text that the statement spells another way (with blanks or in several
  // lines) is known by its end and its statement.
  bool TellRoleBehind(const SourceText& source, uint32_t begin, const LineRow& row, const Answer& occurrence) {
    if (!occurrence.name.starts_with('.')) return false;
    if (const auto found = told_behind_.find(begin); found != told_behind_.end()) {
      MoveTo(occurrence, found->second);
      return true;
    }
    const Text last = occurrence.name.substr(occurrence.name.rfind('.'));
    const Token& last_token = source.tokens[row.first_token + row.token_count - 1];
    const uint64_t end = PlaceOf(source.PositionFrom(static_cast<int32_t>(row.first_line), last_token.text));
    auto copy = std::lower_bound(copies_.begin(), copies_.end(), row.first_line + 1,
                                 [this](uint32_t i, uint32_t line) { return answers_[i].line < line; });
    for (size_t tries = 0; tries < kMostCompared && copy != copies_.end(); ++tries, ++copy) {
      if (PlaceOf(answers_[*copy]) > end) break;
      if (answers_[*copy].role != 0 || !answers_[*copy].name.ends_with(last)) continue;
      MoveTo(occurrence, *copy);
      return true;
    }
    return false;
  }

  // With all records of its place and name.
  void MoveTo(const Answer& occurrence, uint32_t first) {
    const Answer& record = answers_[first];
    for (uint32_t i = first; i < record_count_ && PlaceOf(answers_[i]) == PlaceOf(record); ++i) {
      if (answers_[i].name != record.name) continue;
      answers_[i].role = occurrence.role;
      answers_[i].flags = occurrence.flags;
      moved_.push_back({i, occurrence.line, occurrence.column});
    }
  }

  static uint64_t PlaceOf(const Answer& answer) { return uint64_t{answer.line} << 32 | answer.column; }
  static uint64_t PlaceOf(Position place) {
    return (static_cast<uint64_t>(place.line) + 1) << 32 | (static_cast<uint32_t>(place.col) + 1);
  }

  // As records have it: parameters belong to what their statement opens, global names to the module.
  static uint32_t ScopeAt(const Occurrence& root, bool is_parameter, const Bindings& bindings, const ScopeNames& scopes,
                          size_t row) {
    if (root.has_symbol && bindings.IsDeclaredGlobal(bindings.symbols[root.place]) &&
        root.role != NameRole::kDeclaration)
      return 0;
    uint32_t scope = scopes.ScopeOfRow(row);
    if (is_parameter && scopes.ScopeOpenedBy(row) != ScopeNames::kNone) scope = scopes.ScopeOpenedBy(row);
    return scopes.scopes()[scope].name;
  }

  void SortAndUnite() {
    std::stable_sort(answers_.begin(), answers_.end(), [](const Answer& a, const Answer& b) {
      return a.line != b.line ? a.line < b.line : a.column < b.column;
    });
    // Records of one place are few, so each is compared with those in front of it.
    size_t kept = 0;
    size_t place = 0;
    for (size_t i = 0; i < answers_.size(); ++i) {
      if (kept == 0 || answers_[kept - 1].line != answers_[i].line || answers_[kept - 1].column != answers_[i].column)
        place = kept;
      const size_t begin = std::max(place, kept - std::min<size_t>(kept, kMostCompared));
      const auto first = answers_.begin();
      if (std::find(first + static_cast<ptrdiff_t>(begin), first + static_cast<ptrdiff_t>(kept), answers_[i]) ==
          first + static_cast<ptrdiff_t>(kept))
        answers_[kept++] = answers_[i];
    }
    answers_.resize(kept);
  }

  static constexpr size_t kMostCompared = 1000;
  static constexpr Text kTrailers = "([{\"'";

  struct Move {
    uint32_t answer;
    uint32_t line, column;
  };

  const Question question_;
  const Matcher matcher_;
  StatementsWithWord filter_;
  NameBinder binder_;
  const std::unique_ptr<AnswerFormat> format_;
  std::vector<Answer> answers_;
  std::unordered_map<uint64_t, uint32_t> told_;
  std::unordered_map<uint32_t, uint32_t> told_behind_;  // by the offset of the last name
  std::vector<uint32_t> copies_;                        // answers whose name the source does not hold
  std::vector<Move> moved_;
  size_t record_count_ = 0;
  std::string name_;
  TextArena texts_;
};

class AnswerBytes : public AnswerFormat {
 public:
  explicit AnswerBytes(bool with_lines) : with_lines_(with_lines) {}

  void Write(const BatchInput&, const SourceText& source, std::span<const Answer> answers, std::string& out) override {
    AppendNumber(answers.size(), out);
    uint32_t line = 0;
    for (const Answer& answer : answers) {
      AppendNumber(answer.line, out);
      AppendNumber(answer.column, out);
      out += static_cast<char>(answer.kind);
      out += static_cast<char>(answer.opens << 2 | answer.is_record << 1 | static_cast<uint8_t>(answer.is_parameter));
      out += static_cast<char>(answer.role);
      out += static_cast<char>(answer.flags);
      AppendText(answer.scope, out);
      AppendText(answer.name, out);
      AppendText(answer.detail, out);
      if (with_lines_ && answer.line != line) {
        line = answer.line;
        AppendText(SourceLineOf(source, answer), out);
      }
    }
    out += static_cast<char>(with_lines_);
  }

 private:
  const bool with_lines_;
};

// ---- the words of a question ----

void AddPart(Text text, bool at_begin, bool at_end, Uses uses, std::vector<WordPart>& parts) {
  if (text.size() > kMaxWordSize) {
    text = text.substr(0, kMaxWordSize);
    at_end = false;
  }
  parts.push_back({std::string(text), at_begin, at_end, uses});
}

// All words of a name, the last one in these uses.
void AddWords(Text name, Uses others, Uses last, std::vector<WordPart>& parts) {
  ForEachWord(name, 0, [&](Text word, bool is_last) { AddPart(word, true, true, is_last ? last : others, parts); });
}

// The words, or parts of them, that a pattern spells. Behind a star may stand more words, so only one at
// the end is the last one.
void AddPartsOfPattern(Text pattern, Uses others, Uses last, std::vector<WordPart>& parts) {
  for (size_t at = 0; at < pattern.size();) {
    if (!IsWordByte(pattern[at])) {
      ++at;
      continue;
    }
    const size_t begin = at;
    while (at < pattern.size() && IsWordByte(pattern[at])) ++at;
    const bool at_begin = begin == 0 || !IsWildcard(pattern[begin - 1]);
    const bool at_end = at == pattern.size() || !IsWildcard(pattern[at]);
    AddPart(pattern.substr(begin, at - begin), at_begin, at_end, at == pattern.size() ? last : others, parts);
  }
}

void AddScope(const Question& question, std::vector<WordPart>& parts) {
  if (!question.has_scope || question.scope.empty()) return;
  if (IsPattern(question.scope)) {
    AddPartsOfPattern(question.scope, kScopeUse, kScopeUse, parts);
  } else {
    AddWords(question.scope, kScopeUse, kScopeUse, parts);
  }
}

}  // namespace

bool WordPart::Fits(Text word, Uses word_uses) const {
  if (uses != 0 && (uses & word_uses) == 0) return false;
  if (at_begin && !word.starts_with(text)) return false;
  // What was cut off a long word may be anything.
  if (word.size() >= kMaxWordSize) return true;
  if (at_begin && at_end) return word.size() == text.size();
  return at_begin || (at_end ? word.ends_with(text) : word.find(text) != Text::npos);
}

WordNeeds WordsNeededBy(const Question& question) {
  using Match = Question::Match;
  WordNeeds needs;
  if (question.match == Match::kEverything) return {{}};
  const bool is_glob = question.match == Match::kGlob;
  if (question.uses != 0) {
    Uses last = question.uses;
    // The member of a scope is set where it is.
    if (question.match == Match::kExact && question.name.find('.') != std::string::npos)
      last |= UseOfKind(RecordKind::kSet);
    std::vector<WordPart>& parts = needs.emplace_back();
    if (is_glob) {
      AddPartsOfPattern(question.name, 0, last, parts);
    } else {
      AddWords(question.name, 0, last, parts);
    }
    AddScope(question, parts);
  }
  if (question.returns) {
    std::vector<WordPart>& parts = needs.emplace_back();
    if (is_glob) {
      AddPartsOfPattern(question.name, kScopeUse, kScopeUse, parts);
    } else {
      AddWords(question.name, kScopeUse, kScopeUse, parts);
    }
    AddScope(question, parts);
  }
  return needs;
}

bool FitsGlob(Text text, Text pattern) {
  // One way back, to the last star, is enough: what stood in front of it fits already.
  size_t at = 0;
  size_t in_pattern = 0;
  size_t star = Text::npos;
  size_t star_at = 0;
  const auto behind_char = [&](size_t place) {
    ++place;
    while (place < text.size() && !IsUtf8LeadByte(text[place])) ++place;
    return place;
  };
  while (at < text.size()) {
    if (in_pattern < pattern.size() && pattern[in_pattern] == '*') {
      star = in_pattern++;
      star_at = at;
    } else if (in_pattern < pattern.size() && pattern[in_pattern] == '?') {
      ++in_pattern;
      at = behind_char(at);
    } else if (in_pattern < pattern.size() && pattern[in_pattern] == text[at]) {
      ++in_pattern;
      ++at;
    } else if (star != Text::npos) {
      in_pattern = star + 1;
      at = star_at = behind_char(star_at);
    } else {
      return false;
    }
  }
  while (in_pattern < pattern.size() && pattern[in_pattern] == '*') ++in_pattern;
  return in_pattern == pattern.size();
}

std::vector<Text> WordsAlike(std::span<const WordTable::Entry> words, Text pattern) {
  const auto lower = [](Text text, std::string& out) {
    out.assign(text);
    for (char& c : out) c = c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
  };
  std::vector<Text> found;
  std::string wanted, word;
  lower(pattern, wanted);
  for (const WordTable::Entry& entry : words) {
    lower(entry.word, word);
    if (FitsGlob(word, wanted) && !FitsGlob(entry.word, pattern)) found.push_back(entry.word);
  }
  return found;
}

std::unique_ptr<FileWriter> MakeQuestionWriter(const Question& question, Version version,
                                               std::unique_ptr<AnswerFormat> format) {
  return std::make_unique<QuestionWriter>(question, version, std::move(format));
}

Text KindWordOf(const Answer& answer) {
  if (answer.is_record || answer.kind != RecordKind::kOther) return RecordKindWords()[static_cast<size_t>(answer.kind)];
  return NameRoleWords()[answer.role - 1u];
}

std::unique_ptr<AnswerFormat> MakeAnswerBytes(bool with_lines) { return std::make_unique<AnswerBytes>(with_lines); }

Text SourceLineOf(const SourceText& source, const Answer& answer) {
  const std::vector<uint32_t>& starts = source.line_starts;
  if (answer.line == 0 || answer.line > starts.size()) return {};
  const uint32_t begin = starts[answer.line - 1];
  const size_t end = answer.line < starts.size() ? starts[answer.line] : source.size();
  Text text = source.text().substr(begin, end - begin);
  text = text.substr(0, text.find_last_not_of("\r\n") + 1);
  if (text.size() <= kMaxLineSize) return text;
  size_t size = kMaxLineSize;
  while (size > 0 && !IsUtf8LeadByte(text[size])) --size;
  return text.substr(0, size);
}

bool ReadAnswers(Text written, const std::function<void(const Answer&, Text line)>& take) {
  if (written.empty()) return false;
  const bool with_lines = written.back() != 0;
  ByteReader reader(written.substr(0, written.size() - 1));
  const uint64_t count = reader.NumberUpTo(written.size());
  uint32_t line = 0;
  Text source_line;
  for (uint64_t i = 0; i < count; ++i) {
    Answer answer;
    answer.line = static_cast<uint32_t>(reader.NumberUpTo(UINT32_MAX));
    answer.column = static_cast<uint32_t>(reader.NumberUpTo(UINT32_MAX));
    const uint64_t kind = reader.NumberUpTo(RecordKindWords().size() - 1);
    const uint64_t flags = reader.NumberUpTo(15);
    answer.kind = static_cast<RecordKind>(kind);
    answer.is_parameter = (flags & 1) != 0;
    answer.is_record = (flags & 2) != 0;
    answer.opens = static_cast<uint8_t>(flags >> 2);
    answer.role = static_cast<uint8_t>(reader.NumberUpTo(NameRoleWords().size()));
    answer.flags = static_cast<uint8_t>(reader.NumberUpTo(63));
    answer.scope = reader.String();
    answer.name = reader.String();
    answer.detail = reader.String();
    if (with_lines && answer.line != line) {
      line = answer.line;
      source_line = reader.String();
    }
    if (reader.failed()) return false;
    take(answer, source_line);
  }
  return reader.left() == 0;
}

}  // namespace quillet
