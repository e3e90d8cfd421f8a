// Two threads bind files with binders of their own, and number texts among themselves; behind them what they found is
// put together.
#include "program/defined_names.h"

#include <array>
#include <optional>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "foundations/stop.h"
#include "names/binder.h"
#include "names/text_table.h"
#include "program/blanks.h"
#include "program/possible_symbols.h"
#include "program/two_threads.h"
#include "project/file_system.h"
#include "project/word_search.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// Fewer files than this are bound before another thread has begun.
constexpr size_t kFilesWorthABinder = 16;
constexpr size_t kBytesOfAStepOfBinding = 16;

using Definition = DefinedNames::Definition;
using PossibleSymbol = DefinedNames::PossibleSymbol;

// Binds one file after another, and takes what is defined from each.
class DefinitionsMaker {
 public:
  struct Made {
    size_t index;
    FileStamp stamp;
    size_t begin, count;  // among the definitions or the possible symbols
    bool is_possible = false;
  };

  void Begin() {
    made.clear();
    definitions.clear();
    possible.clear();
    last_file_.clear();
    texts.Begin(kExpectedTexts);
  }

  // False where the text does not tell. `source` is as it was behind it.
  bool MakePossible(size_t index, const FileStamp& stamp, Version version, std::string& source) {
    if (!lines_.Read(source, version)) return false;
    const size_t begin = possible.size();
    for (const auto& [name, is_variable] : lines_.symbols()) {
      const uint32_t number = 2 * texts.NumberOfCopy(name) + (is_variable ? 1 : 0);
      if (number >= last_file_.size()) last_file_.resize(2 * texts.size(), kNoIndex);
      if (last_file_[number] == index) continue;
      last_file_[number] = static_cast<uint32_t>(index);
      possible.push_back({number / 2, number % 2});
    }
    made.push_back({index, stamp, begin, possible.size() - begin, true});
    return true;
  }

  void Make(size_t index, const FileStamp& stamp, bool is_stub, Version version, Text source) {
    std::optional<NameBinder>& binder = is_stub ? stub_binder_ : binder_;
    if (!binder) binder.emplace(version);
    Make(index, stamp, binder->Bind(source), source);
  }
  void Make(size_t index, const FileStamp& stamp, const Bindings& bindings, Text source) {
    const size_t begin = definitions.size();
    Take(bindings, source);
    made.push_back({index, stamp, begin, definitions.size() - begin});
  }

  std::vector<Made> made;
  std::vector<Definition> definitions;
  std::vector<PossibleSymbol> possible;
  TextTable texts;
  std::string memory;

 private:
  static constexpr size_t kExpectedTexts = 1024;
  static constexpr uint32_t kNotAsked = kNoIndex - 1;

  void Take(const Bindings& bindings, Text source) {
    line_begin_ = SIZE_MAX;
    scopes_.assign(bindings.scopes.size(), kNotAsked);
    texts_.assign(bindings.texts.size(), kNoIndex);
    seen_.assign(bindings.symbols.size(), 0);
    for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
      const Occurrence& occurrence = bindings.occurrences[i];
      if (!occurrence.binds() ? !IsOfSelf(bindings, i) : !IsDefinition(bindings, occurrence)) continue;
      Definition definition{};
      definition.begin = occurrence.begin;
      const Position place = bindings.PositionOf(occurrence.begin);
      const size_t line_begin = place.line == 0 ? 0 : occurrence.begin - static_cast<size_t>(place.col);
      const size_t end = occurrence.begin + bindings.TextOf(occurrence).size();
      definition.line = place.line + 1;
      definition.column = IsAscii(source, line_begin, end) ? place.col + 1 : 0;
      definition.role = occurrence.role;
      definition.kind = occurrence.kind;
      definition.of_self = !occurrence.binds();
      const uint32_t scope = bindings.ScopeOf(occurrence);
      definition.in_class = bindings.scopes[scope].kind == NameScopeKind::kClass;
      definition.name = NumberOf(bindings, occurrence.text);
      definition.scope = NumberOfScope(bindings, scope);
      definition.is_symbol = occurrence.has_symbol && !definition.of_self;
      if (definition.is_symbol && occurrence.kind == NameKind::kVariable) {
        char& is_seen = seen_[bindings.VariableOf(occurrence)];
        definition.is_symbol = is_seen == 0;
        is_seen = 1;
      }
      definitions.push_back(definition);
    }
  }

  // From the beginning of a line: what was looked at of it is not looked at again.
  bool IsAscii(Text source, size_t line_begin, size_t end) {
    if (line_begin != line_begin_) {
      line_begin_ = line_begin;
      ascii_end_ = line_begin;
    }
    while (ascii_end_ < end && static_cast<unsigned char>(source[ascii_end_]) < 0x80) ++ascii_end_;
    return ascii_end_ >= end;
  }

  static bool IsDefinition(const Bindings& bindings, const Occurrence& occurrence) {
    if (occurrence.kind == NameKind::kClass || occurrence.kind == NameKind::kFunction) return true;
    const NameScopeKind around = bindings.scopes[bindings.ScopeOf(occurrence)].kind;
    if (around == NameScopeKind::kClass) return occurrence.kind != NameKind::kImport;
    return occurrence.kind == NameKind::kVariable && around == NameScopeKind::kModule;
  }

  static bool IsOfSelf(const Bindings& bindings, uint32_t i) {
    const Occurrence& occurrence = bindings.occurrences[i];
    if (!occurrence.is_attribute || (occurrence.role != NameRole::kWrite && occurrence.role != NameRole::kDefinition))
      return false;
    const uint32_t receiver = bindings.ReceiverOf(i);
    return receiver != kNoIndex && bindings.TextOf(bindings.occurrences[receiver]) == "self";
  }

  uint32_t NumberOf(const Bindings& bindings, uint32_t text) {
    uint32_t& number = texts_[text];
    if (number == kNoIndex) number = texts.NumberOfCopy(bindings.texts[text]);
    return number;
  }

  uint32_t NumberOfScope(const Bindings& bindings, uint32_t scope) {
    uint32_t& number = scopes_[scope];
    if (number == kNotAsked) {
      const std::string name = DottedNameOf(bindings, scope);
      number = name.empty() ? kNoIndex : texts.NumberOfCopy(name);
    }
    return number;
  }

  std::optional<NameBinder> binder_;
  std::optional<NameBinder> stub_binder_;
  PossibleSymbols lines_;
  std::vector<uint32_t> last_file_;  // that has a possible symbol, by its numbers
  // Of the file: numbers of texts and of scopes, and whether a variable was bound before.
  std::vector<uint32_t> texts_;
  std::vector<uint32_t> scopes_;
  std::vector<char> seen_;
  size_t line_begin_ = SIZE_MAX;  // of the line looked at last
  size_t ascii_end_ = 0;          // up to which it is ASCII
};

// ---- whether a text may define a member, without its analysis ----

// Where the line of a place begins, where what stands on it does, and how far that is indented.
struct Line {
  size_t begin, first, indent;
};
Line LineAround(Text source, size_t at) {
  static constexpr size_t kTab = 8;
  size_t begin = at;
  while (begin > 0 && !IsLineEnd(source[begin - 1])) --begin;
  size_t first = begin, indent = 0;
  for (; first < source.size() && IsBlank(source[first]); ++first)
    indent = source[first] == '\t' ? (indent / kTab + 1) * kTab : indent + 1;
  return {begin, first, indent};
}

bool BeginsWithWord(Text text, Text word) {
  return text.starts_with(word) && (text.size() == word.size() || IsBlank(text[word.size()]));
}

// Whether what stands behind a name lets it be a target.
bool MayFollowTarget(Text behind) {
  size_t at = 0;
  while (at < behind.size() && IsBlank(behind[at])) ++at;
  behind.remove_prefix(at);
  if (behind.empty()) return true;
  switch (behind.front()) {
    case '(':
    case '.':
    case '[':
      return false;
    case '=':
      return !behind.starts_with("==");
    case '+':
    case '-':
    case '*':
    case '/':
    case '%':
    case '@':
    case '&':
    case '|':
    case '^':
    case '<':
    case '>':
    case '!':
      return behind.substr(0, 3).find('=') != Text::npos;
    default:
      return true;
  }
}

size_t CountOf(Text text, Text mark) {
  size_t count = 0;
  for (size_t at = 0; (at = text.find(mark, at)) != Text::npos; at += mark.size()) ++count;
  return count;
}

// Whether a place lies in the body of a function or module rather than of a class, by what the lines in front of it
// that are less and less indented begin with. Where a string or a bracket may be open in between, that is not known.
bool IsSurelyLocal(Text source, size_t place, size_t& budget) {
  Line line = LineAround(source, place);
  size_t indent = line.indent;
  if (BeginsWithWord(source.substr(line.first), "class")) return false;
  bool is_in_function = false;
  while (!is_in_function && indent > 0 && line.begin > 0) {
    const size_t behind = line.begin;
    line = LineAround(source, behind - 1);
    if (budget < behind - line.begin) return false;
    budget -= behind - line.begin;
    const Text text = source.substr(line.first);
    if (line.indent >= indent || IsLineEnd(text.front()) || text.front() == '#') continue;
    if (BeginsWithWord(text, "class")) return false;
    if (!IsIdentifierByte(text.front()) && text.front() != '@') return false;
    indent = line.indent;
    is_in_function = BeginsWithWord(text, "def") || BeginsWithWord(text, "async");
  }
  const Text between = source.substr(line.begin, place - line.begin);
  if (budget < between.size()) return false;
  budget -= between.size();
  return CountOf(between, "\"\"\"") % 2 == 0 && CountOf(between, "'''") % 2 == 0;
}

bool MayDefineMember(Text source, Text name) {
  static constexpr Text kReceiver = "self.";
  static constexpr size_t kMostLooks = 8;
  size_t budget = kMostLooks * source.size();  // bytes that are looked at again
  for (size_t at = 0; (at = FindWord(source, name, at)) != Text::npos; at += name.size()) {
    const Text behind = source.substr(at + name.size());
    size_t before = at;
    while (before > 0 && IsBlank(source[before - 1])) --before;
    if (before > 0 && source[before - 1] == '.') {
      const bool is_of_self = before == at ? source.substr(0, at).ends_with(kReceiver) : true;
      if (is_of_self && MayFollowTarget(behind)) return true;
      continue;
    }
    const Text head = source.substr(0, before);
    if (head.ends_with("def") || head.ends_with("class")) {
      if (LineAround(source, at).indent > 0) return true;
      continue;
    }
    if (MayFollowTarget(behind) && !IsSurelyLocal(source, at, budget)) return true;
  }
  return false;
}

}  // namespace

std::string DottedNameOf(const Bindings& bindings, uint32_t scope) {
  static constexpr int kMaxScopes = 400;  // the innermost: no version runs what nests so deeply
  std::string name;
  for (int i = 0; i < kMaxScopes && scope != kNoIndex && scope != 0; ++i, scope = bindings.scopes[scope].parent) {
    const NameScope& around = bindings.scopes[scope];
    if ((around.kind != NameScopeKind::kClass && around.kind != NameScopeKind::kFunction) || around.name == kNoIndex)
      continue;
    const Text own = bindings.texts[around.name];
    name = name.empty() ? std::string(own) : std::string(own) + "." + name;
  }
  return name;
}

class DefinedNames::Impl {
 public:
  explicit Impl(const Files& files) : files_(files) { texts_.Begin(1024); }

  void Read(std::span<const FileId> files, Text member) { Update(files, member, false); }
  void ReadPossible(std::span<const FileId> files) { Update(files, kNoText, true); }

  bool IsRead(FileId file) const { return file < tables_.size() && tables_[file].round == round_; }
  std::span<const PossibleSymbol> PossibleOf(FileId file) const {
    return file < tables_.size() ? std::span<const PossibleSymbol>(tables_[file].possible)
                                 : std::span<const PossibleSymbol>();
  }

  std::span<const Definition> Of(FileId file) const {
    return file < tables_.size() ? std::span<const Definition>(tables_[file].definitions)
                                 : std::span<const Definition>();
  }
  uint32_t text_count() const { return static_cast<uint32_t>(texts_.size()); }
  Text TextOf(uint32_t number) const { return texts_.TextOf(number); }
  uint32_t Find(Text name) const { return texts_.Find(name); }
  void Forget() { ++round_; }

  size_t ByteSize() const {
    size_t size = tables_.capacity() * sizeof(Table) + texts_.size() * (sizeof(TextTable::Entry) + 32);
    for (const Table& table : tables_)
      size += table.definitions.capacity() * sizeof(Definition) + table.possible.capacity() * sizeof(PossibleSymbol);
    return size;
  }

 private:
  struct Table {
    FileStamp stamp;     // of a buffer what its text is known by
    uint64_t round = 0;  // when it was compared with the file
    std::vector<Definition> definitions;
    // The same of what it may define.
    FileStamp possible_stamp;
    uint64_t possible_round = 0;
    std::vector<PossibleSymbol> possible;
  };

  void Update(std::span<const FileId> files, Text member, bool may_be_possible) {
    std::vector<FileId> unsure;
    for (const FileId file : files) {
      if (file >= tables_.size()) tables_.resize(file + 1);
      const Table& table = tables_[file];
      const bool is_known = table.round == round_ || (may_be_possible && table.possible_round == round_);
      if (!is_known || files_.IsOpen(file)) unsure.push_back(file);
    }
    if (unsure.empty()) return;
    std::array<DefinitionsMaker, 2> makers;
    for (DefinitionsMaker& maker : makers) maker.Begin();
    enum class Found : uint8_t { kDefinitions, kPossible, kNothing };
    std::vector<Found> found(unsure.size());
    ForEachByThreads(unsure.size(), kFilesWorthABinder, makers, [&](size_t i, DefinitionsMaker& maker) {
      const FileId file = unsure[i];
      const Table& table = tables_[file];
      const bool is_open = files_.IsOpen(file);
      Text source;
      FileStamp stamp;
      if (is_open) {
        source = files_.SourceOf(file, maker.memory);
        stamp = {FileStamp::Kind::kOther, source.size(), 0, std::hash<Text>()(source)};
      } else {
        stamp = StampOf(files_.PathOf(file));
      }
      if (stamp == table.stamp) return;
      found[i] = Found::kPossible;
      if (may_be_possible && !is_open && stamp == table.possible_stamp) return;
      const SourceFile* const held = files_.HeldAs(file, stamp);
      if (held != nullptr) {
        source = held->text();
      } else if (!is_open) {
        files_.ReadSource(file, stamp, maker.memory);
        if (may_be_possible && maker.MakePossible(i, SettledStamp(stamp), files_.VersionOf(file), maker.memory)) return;
        source = maker.memory;
      }
      found[i] = Found::kNothing;
      if (!IsNone(member) && table.round == 0 && !MayDefineMember(source, member)) return;
      found[i] = Found::kDefinitions;
      if (held != nullptr) {  // bound before
        maker.Make(i, SettledStamp(stamp), held->bindings, source);
        return;
      }
      CountSteps(static_cast<int64_t>(source.size() / kBytesOfAStepOfBinding));
      maker.Make(i, SettledStamp(stamp), files_.IsStub(file), files_.VersionOf(file), source);
    });
    for (const DefinitionsMaker& maker : makers) Add(unsure, maker);
    for (size_t i = 0; i < unsure.size(); ++i) {
      if (found[i] == Found::kDefinitions) tables_[unsure[i]].round = round_;
      if (found[i] == Found::kPossible) tables_[unsure[i]].possible_round = round_;
    }
  }

  void Add(const std::vector<FileId>& files, const DefinitionsMaker& maker) {
    std::vector<uint32_t> numbers(maker.texts.size());
    for (uint32_t i = 0; i < numbers.size(); ++i) numbers[i] = texts_.NumberOfCopy(maker.texts.TextOf(i));
    for (const DefinitionsMaker::Made& made : maker.made) {
      Table& table = tables_[files[made.index]];
      if (made.is_possible) {
        const auto first = maker.possible.begin() + static_cast<ptrdiff_t>(made.begin);
        table.possible_stamp = made.stamp;
        table.possible = std::vector<PossibleSymbol>(first, first + static_cast<ptrdiff_t>(made.count));
        for (PossibleSymbol& symbol : table.possible) symbol.name = numbers[symbol.name] & kMostNames;
        continue;
      }
      table.stamp = made.stamp;
      table.possible = {};
      table.possible_stamp = {};
      const auto from = maker.definitions.begin() + static_cast<ptrdiff_t>(made.begin);
      table.definitions = std::vector<Definition>(from, from + static_cast<ptrdiff_t>(made.count));
      for (Definition& definition : table.definitions) {
        definition.name = numbers[definition.name];
        if (definition.scope != kNoIndex) definition.scope = numbers[definition.scope];
      }
    }
  }

  static constexpr uint32_t kMostNames = UINT32_MAX >> 1;

  const Files& files_;
  std::vector<Table> tables_;  // by the numbers of files
  TextTable texts_;
  uint64_t round_ = 1;
};

DefinedNames::DefinedNames(const Files& files) : impl_(std::make_unique<Impl>(files)) {}
DefinedNames::~DefinedNames() = default;

void DefinedNames::Read(std::span<const FileId> files) { impl_->Read(files, kNoText); }
void DefinedNames::ReadForMember(std::span<const FileId> files, Text name) { impl_->Read(files, name); }
void DefinedNames::ReadPossible(std::span<const FileId> files) { impl_->ReadPossible(files); }
std::span<const Definition> DefinedNames::Of(FileId file) const { return impl_->Of(file); }
std::span<const DefinedNames::PossibleSymbol> DefinedNames::PossibleOf(FileId file) const {
  return impl_->PossibleOf(file);
}
bool DefinedNames::IsRead(FileId file) const { return impl_->IsRead(file); }
uint32_t DefinedNames::text_count() const { return impl_->text_count(); }
Text DefinedNames::TextOf(uint32_t number) const { return impl_->TextOf(number); }
uint32_t DefinedNames::Find(Text name) const { return impl_->Find(name); }
void DefinedNames::Forget() { impl_->Forget(); }
size_t DefinedNames::ByteSize() const { return impl_->ByteSize(); }

}  // namespace quillet
