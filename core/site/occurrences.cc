// Records say what a statement does to a name; here they become one occurrence a place, and names are looked
// up in the scopes around them.
#include "site/occurrences.h"

#include <algorithm>

#include "foundations/utf8.h"

namespace quillet {

namespace {

// Facts of one name hold at most so many bytes.
constexpr size_t kMostFacts = 240;

bool IsLineEnd(char c) { return c == '\n' || c == '\r'; }

// A plain or dotted name: letters, digits, "_" and dots between.
bool IsDottedName(Text name) {
  bool begins = true;
  for (const char c : name) {
    if (c == '.') {
      if (begins) return false;
      begins = true;
      continue;
    }
    const bool ascii = static_cast<uint8_t>(c) < 0x80;
    if (ascii && (AsciiClassOf(c) & (kAsciiAlpha | kAsciiUnderscore | (begins ? 0 : kAsciiDigit))) == 0) return false;
    begins = false;
  }
  return !begins;
}

bool IsOfSelf(Text name) { return name.starts_with("self.") || name.starts_with("cls."); }

// What matters most of several things that are said of one place.
int Weight(const SiteOccurrence& occurrence) {
  switch (occurrence.role) {
    case NameRole::kDefinition:
      return 4;
    case NameRole::kImport:
      return 3;
    case NameRole::kWrite:
      return 2;
    case NameRole::kCall:
      return 1;
    default:
      return 0;
  }
}

}  // namespace

// ---- what is shown ----

ShownPart::ShownPart(const SourceText& source) : source_(source) {
  line_count_ = static_cast<uint32_t>(source.line_starts.size());
  if (line_count_ != 0 && source.line_starts.back() >= source.size()) --line_count_;
  size_t bytes = 0;
  while (shown_lines_ < line_count_ && bytes < kMostBytes) {
    bytes += ShownEndOf(shown_lines_) - BeginOf(shown_lines_) + 1;
    shows_whole_lines_ = shows_whole_lines_ && ShownEndOf(shown_lines_) == EndOf(shown_lines_);
    ++shown_lines_;
  }
}

uint32_t ShownPart::EndOf(uint32_t line) const {
  uint32_t end =
      line + 1 < source_.line_starts.size() ? source_.line_starts[line + 1] : static_cast<uint32_t>(source_.size());
  while (end > BeginOf(line) && IsLineEnd(source_.begin()[end - 1])) --end;
  return end;
}

uint32_t ShownPart::ShownEndOf(uint32_t line) const {
  uint32_t end = EndOf(line);
  if (end - BeginOf(line) <= kMostBytesOfLine) return end;
  end = BeginOf(line) + kMostBytesOfLine;
  while (end > BeginOf(line) && !IsUtf8LeadByte(source_.begin()[end])) --end;
  return end;
}

// ---- what is named ----

void SiteOccurrences::Collect(const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
                              const ShownPart& shown) {
  found_.clear();
  facts_.clear();
  opened_.clear();
  FindScopes(scopes);
  const char* const source = file.source().begin();
  for (const ScopeNames::Scope& scope : scopes.scopes()) {
    using Kind = ScopeNames::ScopeKind;
    if (scope.kind == Kind::kModule || !file.source().Holds(scope.own_name.data())) continue;
    const NameKind kind = scope.kind == Kind::kClass      ? NameKind::kClass
                          : scope.kind == Kind::kFunction ? NameKind::kFunction
                                                          : NameKind::kTypeAlias;
    opened_.emplace(static_cast<uint32_t>(scope.own_name.data() - source), kind);
  }
  placed.Begin(file, scopes);
  for (size_t row = 0; row < file.rows().size(); ++row) {
    if (file.rows()[row].first_line >= shown.shown_lines()) break;
    for (const PlacedRecord& record : placed.OfRow(row)) AddRecord(record, file, shown);
  }
  Settle(file.source().text(), scopes);
}

void SiteOccurrences::FindScopes(const ScopeNames& scopes) {
  scopes_.assign(scopes.names().size(), {});
  for (const ScopeNames::Scope& scope : scopes.scopes()) {
    ScopeAround& around = scopes_[scope.name];
    around.is_class = scope.kind == ScopeNames::ScopeKind::kClass;
    around.is_shared = scope.kind == ScopeNames::ScopeKind::kModule || around.is_class;
    if (scope.parent != ScopeNames::kNone && scopes.scopes()[scope.parent].name != scope.name)
      around.parent = scopes.scopes()[scope.parent].name;
  }
}

void SiteOccurrences::AddRecord(const PlacedRecord& record, const FileAnalyzer& file, const ShownPart& shown) {
  const uint32_t line = record.line - 1;
  if (line >= shown.shown_lines() || !IsDottedName(record.name)) return;
  const uint32_t place = shown.BeginOf(line) + record.column - 1;
  const auto size = static_cast<uint32_t>(record.name.size());
  if (!shown.Shows(line, place + size)) return;
  if (file.source().text().substr(place, size) != record.name) return;
  const size_t dot = record.name.rfind('.');
  const uint32_t tail = dot == Text::npos ? 0 : static_cast<uint32_t>(dot) + 1;
  Found found{{place + tail, size - tail, line, kNone, NameRole::kRead, NameKind::kNone, tail != 0}, record.scope};
  AddFact(record, place + tail);
  switch (record.kind) {
    case RecordKind::kSet: {
      const auto opened = opened_.find(place + tail);
      if (opened != opened_.end()) found.occurrence.kind = opened->second;
      if (record.is_parameter) found.occurrence.kind = NameKind::kParameter;
      found.occurrence.role = found.occurrence.kind == NameKind::kNone ? NameRole::kWrite : NameRole::kDefinition;
      break;
    }
    case RecordKind::kGet:
      break;
    case RecordKind::kCalled:
      found.occurrence.role = NameRole::kCall;
      break;
    case RecordKind::kImport:
    case RecordKind::kFromImport:
      found.occurrence.role = NameRole::kImport;
      break;
    case RecordKind::kGlobal:
    case RecordKind::kNonlocal:
      found.occurrence.role = NameRole::kDeclaration;
      break;
    default:
      return;
  }
  // Attributes of the object itself belong to the class around the method.
  if (IsOfSelf(record.name) && record.name.find('.') == dot && scopes_[record.scope].parent != kNone &&
      scopes_[scopes_[record.scope].parent].is_class && found.occurrence.role == NameRole::kWrite) {
    found.occurrence.kind = NameKind::kVariable;
    found.scope = scopes_[record.scope].parent;
  }
  found_.push_back(found);
}

void SiteOccurrences::AddFact(const PlacedRecord& record, uint32_t begin) {
  if (record.detail.empty()) return;
  Text word;
  switch (record.kind) {
    case RecordKind::kHint:
      word = ": ";
      break;
    case RecordKind::kLiteral:
    case RecordKind::kEqual:
    case RecordKind::kExpression:
      word = "= ";
      break;
    case RecordKind::kInstance:
      word = "instance of ";
      break;
    case RecordKind::kImport:
      word = "import ";
      break;
    case RecordKind::kFromImport:
      word = "from ";
      break;
    default:
      return;
  }
  std::string fact(word);
  fact += record.detail;
  std::string& facts = facts_[begin];
  if (facts.size() + fact.size() > kMostFacts || facts.find(fact) != std::string::npos) return;
  if (record.kind == RecordKind::kHint)
    facts = facts.empty() ? fact : fact + "  " + facts;
  else
    facts += facts.empty() ? fact : "  " + fact;
}

void SiteOccurrences::Settle(Text source, const ScopeNames& scopes) {
  std::stable_sort(found_.begin(), found_.end(), [](const Found& one, const Found& two) {
    if (one.occurrence.begin != two.occurrence.begin) return one.occurrence.begin < two.occurrence.begin;
    return Weight(one.occurrence) > Weight(two.occurrence);
  });
  found_.erase(
      std::unique(found_.begin(), found_.end(),
                  [](const Found& one, const Found& two) { return one.occurrence.begin == two.occurrence.begin; }),
      found_.end());

  occurrences_.clear();
  symbols_.clear();
  definitions_.clear();
  symbol_index_.clear();
  const auto text_of = [source](const SiteOccurrence& of) { return source.substr(of.begin, of.size); };
  for (size_t i = 0; i < found_.size(); ++i) {
    SiteOccurrence occurrence = found_[i].occurrence;
    const uint32_t scope = found_[i].scope;
    const bool binds = occurrence.role == NameRole::kDefinition || occurrence.role == NameRole::kWrite ||
                       occurrence.role == NameRole::kImport;
    const Text name = text_of(occurrence);
    if (binds && (!occurrence.is_attribute || occurrence.kind == NameKind::kVariable)) {
      // An attribute of the object itself has a symbol of the class only to be listed once.
      const Key key{scope, occurrence.is_attribute ? source.substr(occurrence.begin - 1, occurrence.size + 1) : name};
      const auto [entry, is_new] = symbol_index_.emplace(key, static_cast<uint32_t>(symbols_.size()));
      if (is_new) {
        if (occurrence.kind == NameKind::kNone && occurrence.role == NameRole::kWrite)
          occurrence.kind = NameKind::kVariable;
        if (occurrence.role == NameRole::kImport) occurrence.kind = NameKind::kImport;
        if (!occurrence.is_attribute && occurrence.role == NameRole::kWrite) occurrence.role = NameRole::kDefinition;
        symbols_.push_back(
            {name, static_cast<uint32_t>(i), scopes_[scope].is_shared, occurrence.role == NameRole::kImport});
      }
      const bool opens = occurrence.kind == NameKind::kClass || occurrence.kind == NameKind::kFunction ||
                         occurrence.kind == NameKind::kTypeAlias;
      const bool is_listed =
          occurrence.kind != NameKind::kImport && occurrence.kind != NameKind::kParameter && scopes_[scope].is_shared;
      if (opens || (is_new && is_listed)) definitions_.push_back({static_cast<uint32_t>(i), scopes.names()[scope]});
    } else if (occurrence.kind == NameKind::kVariable) {
      occurrence.kind = NameKind::kNone;
    }
    occurrences_.push_back(occurrence);
  }
  for (size_t i = 0; i < occurrences_.size(); ++i) {
    if (!occurrences_[i].is_attribute) occurrences_[i].symbol = SymbolOf(found_[i].scope, text_of(occurrences_[i]));
  }
}

uint32_t SiteOccurrences::SymbolOf(uint32_t scope, Text name) const {
  for (bool is_own = true; scope != kNone; scope = scopes_[scope].parent, is_own = false) {
    if (!is_own && scopes_[scope].is_class) continue;
    const auto entry = symbol_index_.find({scope, name});
    if (entry != symbol_index_.end()) return entry->second;
  }
  return kNone;
}

Text SiteOccurrences::FactsOf(size_t occurrence) const {
  const auto facts = facts_.find(occurrences_[occurrence].begin);
  return facts != facts_.end() ? Text(facts->second) : Text();
}

}  // namespace quillet
