// Two threads bind files with binders of their own, and number texts among themselves; behind them what they found is
// put together.
#include "program/defined_names.h"

#include <algorithm>
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

bool HoldMember(const std::vector<PossibleSymbols::Symbol>& symbols, Text name) {
  return std::ranges::any_of(
      symbols, [&](const PossibleSymbols::Symbol& symbol) { return symbol.may_be_member && symbol.name == name; });
}

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

  // False where the text does not tell, or it says that a text that is given may be a member. `source` is as it was
  // behind it.
  bool MakePossible(size_t index, const FileStamp& stamp, Version version, std::string& source, Text member) {
    static constexpr uint32_t kSorts = 4;
    if (!lines_.Read(source, version)) return false;
    if (HoldMember(lines_.symbols(), member)) return false;
    const size_t begin = possible.size();
    for (const auto& [name, is_variable, may_be_member] : lines_.symbols()) {
      const uint32_t sort = (is_variable ? 1 : 0) + (may_be_member ? 2 : 0);
      const uint32_t number = kSorts * texts.NumberOfCopy(name) + sort;
      if (number >= last_file_.size()) last_file_.resize(kSorts * texts.size(), kNoIndex);
      if (last_file_[number] == index) continue;
      last_file_[number] = static_cast<uint32_t>(index);
      possible.push_back({number / kSorts, is_variable, may_be_member});
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

  // Whether a name is a member there.
  static bool HasMember(const Bindings& bindings, Text name) {
    uint32_t number = 0;
    while (number < bindings.texts.size() && bindings.texts[number] != name) ++number;
    if (number == bindings.texts.size()) return false;
    for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
      const Occurrence& occurrence = bindings.occurrences[i];
      if (occurrence.text != number) continue;
      const bool in_class = bindings.scopes[bindings.ScopeOf(occurrence)].kind == NameScopeKind::kClass;
      if (occurrence.binds() ? in_class && IsDefinition(bindings, occurrence) : IsOfSelf(bindings, i)) return true;
    }
    return false;
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

// Whether what stands on a line in front of an attribute's name is what it is an attribute of, and no more than that
// behind the last mark that a statement may follow.
bool IsReceiver(Text head) {
  head.remove_prefix(head.find_last_of(":;") + 1);
  while (!head.empty() && IsBlank(head.front())) head.remove_prefix(1);
  return std::ranges::all_of(head, [](char c) { return IsIdentifierByte(c) || c == '.'; });
}

// Whether an attribute whose name is there may be given something: by itself, among the targets of an assignment, of a
// loop or of a `with`. `budget` is how many bytes may still be looked at; behind that it may.
bool MayBeGiven(Text source, size_t begin, size_t end, size_t& budget) {
  static constexpr Text kInTargets = " \t\f.,*()[]\\";
  const Text behind = source.substr(end);
  if (!MayFollowTarget(behind)) return false;
  const Text head = source.substr(0, begin).substr(source.substr(0, begin).find_last_of("\n\r") + 1);
  budget -= std::min(budget, head.size());
  if (HoldsWord(head, "as")) return true;
  if (const size_t loop = head.rfind("for"); loop != Text::npos && !HoldsWord(head.substr(loop), "in")) return true;
  char last = 'a';
  for (size_t at = 0; at < behind.size(); ++at) {
    if (budget == 0) return true;
    --budget;
    const char c = behind[at];
    if (IsLineEnd(c)) {
      const size_t next = behind.find_first_not_of(" \t\f\n\r", at);
      const bool goes_on = last == ',' || last == '(' || last == '[' || last == '\\';
      if (next == Text::npos || (!goes_on && behind[next] != ')' && behind[next] != ']')) return false;
      at = next - 1;
    } else if (c == '#') {
      at = std::min(behind.find_first_of("\n\r", at), behind.size()) - 1;
    } else if (IsIdentifierByte(c) || kInTargets.find(c) != Text::npos) {
      if (!IsBlank(c)) last = c;
    } else if (c == ':') {
      return IsReceiver(head);
    } else {
      return behind.substr(at, 3).find('=') != Text::npos && !behind.substr(at).starts_with("==");
    }
  }
  return false;
}

// What the places of a name say, where strings and comments count as code. The receiver ends in a dot.
enum class MemberUse : uint8_t {
  kNone,        // no place defines a member
  kOfBody,      // one may, if it stands in the body of a class
  kOfReceiver,  // an attribute of the receiver may be given something
};
constexpr Text kSelf = "self.", kAnyReceiver = ".";
MemberUse UseAsMember(Text source, Text name, Text wanted) {
  static constexpr size_t kMostLooks = 8;
  size_t budget = kMostLooks * source.size();
  MemberUse use = MemberUse::kNone;
  for (size_t at = 0; (at = FindWord(source, name, at)) != Text::npos; at += name.size()) {
    size_t before = at;
    while (before > 0 && IsBlank(source[before - 1])) --before;
    const Text head = source.substr(0, before);
    const size_t end = at + name.size();
    if (head.ends_with('.')) {
      const bool may_be_wanted = before < at || head.ends_with(wanted);
      if (may_be_wanted && MayBeGiven(source, at, end, budget)) return MemberUse::kOfReceiver;
    } else if (MayFollowTarget(source.substr(end)) || head.ends_with("def") || head.ends_with("class")) {
      use = MemberUse::kOfBody;
    }
  }
  return use;
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

  bool MayDefineMember(FileId file, Text name) const {
    std::string memory;
    const Text source = files_.SourceOf(file, memory);
    const MemberUse use = UseAsMember(source, name, kAnyReceiver);
    if (use == MemberUse::kOfReceiver || HoldsWord(source, "__slots__")) return true;
    if (use == MemberUse::kNone) return false;
    if (source.data() != memory.data()) memory = source;
    PossibleSymbols lines;
    return !lines.Read(memory, files_.VersionOf(file)) || HoldMember(lines.symbols(), name);
  }

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
        if (may_be_possible &&
            maker.MakePossible(i, SettledStamp(stamp), files_.VersionOf(file), maker.memory, kNoText))
          return;
        source = maker.memory;
      }
      if (!IsNone(member) && table.round == 0) {
        found[i] = Found::kNothing;
        if (held != nullptr) {
          if (!DefinitionsMaker::HasMember(held->bindings, member)) return;
        } else if (!is_open) {
          const MemberUse use = UseAsMember(source, member, kSelf);
          if (use == MemberUse::kNone) return;
          found[i] = Found::kPossible;
          if (use == MemberUse::kOfBody &&
              (stamp == table.possible_stamp
                   ? !IsPossibleMember(table, member)
                   : maker.MakePossible(i, SettledStamp(stamp), files_.VersionOf(file), maker.memory, member)))
            return;
          source = maker.memory;  // which may have moved
        }
      }
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

  bool IsPossibleMember(const Table& table, Text name) const {
    const uint32_t number = texts_.Find(name);
    return std::ranges::any_of(table.possible, [&](const PossibleSymbol& symbol) {
      return symbol.name == number && symbol.may_be_member != 0;
    });
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

  static constexpr uint32_t kMostNames = UINT32_MAX >> 2;

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
bool DefinedNames::MayDefineMember(FileId file, Text name) const { return impl_->MayDefineMember(file, name); }
bool DefinedNames::IsRead(FileId file) const { return impl_->IsRead(file); }
uint32_t DefinedNames::text_count() const { return impl_->text_count(); }
Text DefinedNames::TextOf(uint32_t number) const { return impl_->TextOf(number); }
uint32_t DefinedNames::Find(Text name) const { return impl_->Find(name); }
void DefinedNames::Forget() { impl_->Forget(); }
size_t DefinedNames::ByteSize() const { return impl_->ByteSize(); }

}  // namespace quillet
