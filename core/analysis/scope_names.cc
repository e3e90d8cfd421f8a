// The stack of open definitions gives each line its scope. Declarations are looked for in a second
// pass over the records, since they hold for lines in front of them; most files have none, and then
// the second pass is all there is to pay.
#include "analysis/scope_names.h"

#include <algorithm>

#include "foundations/shown_text.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

// How far the search for the function that binds a `nonlocal` name goes outwards. Python itself
// admits a hundred levels of indentation.
constexpr int kMaxSearchDepth = 500;
// A definition whose head lacks its name, which is a syntax error.
constexpr Text kNoName = "<no name>";

size_t NextSignificant(TokenSpan toks, size_t i) {
  while (i < toks.size() && IsSkipCode(toks[i].code)) ++i;
  return i;
}

// The name behind the first word `def`, `class` or `type` of a head.
Text NameOfHead(TokenSpan toks) {
  size_t i = NextSignificant(toks, 0);
  if (i < toks.size() && toks[i].code == word::kAsync) i = NextSignificant(toks, i + 1);
  i = NextSignificant(toks, i + 1);
  return i < toks.size() && IsNameCode(toks[i].code) ? toks[i].view() : kNoName;
}

}  // namespace

Text RootOfName(Text name) { return name.substr(0, name.find_first_of(".[( ")); }

void ScopeNames::Build(const FileAnalyzer& file) {
  scopes_.clear();
  names_.clear();
  name_index_.clear();
  declared_.clear();
  nonlocals_.clear();
  texts_.Reset();
  has_declarations_ = false;
  FindScopes(file);
  FindDeclarations(file);
  if (!nonlocals_.empty()) ResolveNonlocals(file);
}

uint32_t ScopeNames::ScopeOpenedBy(size_t row) const {
  // Heads are in order of their rows.
  const auto found = std::lower_bound(scopes_.begin() + 1, scopes_.end(), row,
                                      [](const Scope& scope, size_t at) { return scope.row < at; });
  return found != scopes_.end() && found->row == row ? static_cast<uint32_t>(found - scopes_.begin()) : kNone;
}

void ScopeNames::FindScopes(const FileAnalyzer& file) {
  const std::span<const LineRow> rows = file.rows();
  scopes_.push_back({kNone, kNone, 0, InternName(""), {}, ScopeKind::kModule, false});
  row_scopes_.resize(rows.size());
  open_.assign(1, 0);
  for (uint32_t i = 0; i < rows.size(); ++i) {
    const LineRow& row = rows[i];
    if (row.kind != LineKind::kBlankLine) open_.resize(std::min<size_t>(open_.size(), file.results()[i].depth + 1));
    row_scopes_[i] = open_.back();
    if (row.kind == LineKind::kBlankLine || row.kind == LineKind::kComment) continue;
    scopes_[open_.back()].last_line = row.last_line;
    if (row.kind == LineKind::kTypeStatement) {
      Open(file, i, ScopeKind::kTypeAlias);
    } else if (row.kind == LineKind::kFunctionDef || row.kind == LineKind::kClassDef) {
      const bool is_class = row.kind == LineKind::kClassDef;
      open_.push_back(Open(file, i, is_class ? ScopeKind::kClass : ScopeKind::kFunction));
    }
  }
  // A scope ends no earlier than those inside it, which stand behind it.
  for (size_t i = scopes_.size(); i-- > 1;) {
    Scope& around = scopes_[scopes_[i].parent];
    around.last_line = std::max(around.last_line, scopes_[i].last_line);
  }
}

uint32_t ScopeNames::Open(const FileAnalyzer& file, uint32_t row, ScopeKind kind) {
  const LineRow& head = file.rows()[row];
  const Text own_name = NameOfHead(TokenSpan(file.source().tokens).subspan(head.first_token, head.token_count));
  const uint32_t parent = open_.back();
  const Text around = NameOf(scopes_[parent]);
  uint32_t name = scopes_[parent].name;
  if (around.size() + 1 + own_name.size() <= kMaxNameSize) {
    buffer_.assign(around);
    if (!around.empty()) buffer_ += '.';
    AppendShown(own_name, buffer_);
    name = InternName(buffer_);
  }
  scopes_.push_back({parent, row, head.last_line, name, own_name, kind, false});
  return static_cast<uint32_t>(scopes_.size() - 1);
}

uint32_t ScopeNames::InternName(Text dotted) {
  if (const auto found = name_index_.find(dotted); found != name_index_.end()) return found->second;
  const auto index = static_cast<uint32_t>(names_.size());
  names_.push_back(texts_.Copy(dotted));
  name_index_.emplace(names_.back(), index);
  return index;
}

// Declarations are recorded in the rows of their statement, and statements with none are passed over
// by the number of their records alone.
void ScopeNames::FindDeclarations(const FileAnalyzer& file) {
  const std::vector<Record>& records = file.store().rows;
  const std::span<const FileAnalyzer::LineResult> results = file.results();
  for (size_t i = 0; i < results.size(); ++i) {
    if (results[i].record_begin == results[i].record_end) continue;
    // A declaration's records are all of the one kind.
    const Text first = records[results[i].record_begin].info();
    const bool is_global = first == kGlobalPrefix;
    if (!is_global && first != kNonlocalPrefix) continue;
    const uint32_t scope = row_scopes_[i];
    if (scopes_[scope].kind == ScopeKind::kModule) continue;
    scopes_[scope].has_declarations = true;
    for (uint32_t r = results[i].record_begin; r < results[i].record_end; ++r) {
      const Key key{scope, records[r].name()};
      if (declared_.emplace(key, 0).second && !is_global) nonlocals_.push_back(key);
    }
  }
}

void ScopeNames::ResolveNonlocals(const FileAnalyzer& file) {
  std::unordered_set<Text> wanted;
  for (const Key& key : nonlocals_) wanted.insert(key.name);

  // Where these names are bound, by statements and as parameters.
  std::unordered_set<Key, KeyHash> bound;
  const auto add = [&](uint32_t scope, const Record& record) {
    if (record.info() != kSetPrefix || scopes_[scope].kind != ScopeKind::kFunction) return;
    if (!wanted.contains(record.name())) return;
    const Key key{scope, record.name()};
    if (!declared_.contains(key)) bound.insert(key);
  };
  const std::span<const FileAnalyzer::LineResult> results = file.results();
  for (size_t i = 0; i < results.size(); ++i) {
    for (uint32_t r = results[i].record_begin; r < results[i].record_end; ++r)
      add(row_scopes_[i], file.store().rows[r]);
    if (results[i].arg_record_begin == results[i].arg_record_end) continue;
    const uint32_t opened = ScopeOpenedBy(i);
    if (opened == kNone) continue;
    for (uint32_t r = results[i].arg_record_begin; r < results[i].arg_record_end; ++r)
      add(opened, file.store().arg_rows[r]);
  }

  for (const Key& key : nonlocals_) {
    uint32_t nearest = kNone;
    uint32_t binding = kNone;
    uint32_t around = scopes_[key.scope].parent;
    for (int depth = 0; depth < kMaxSearchDepth && around != kNone; ++depth, around = scopes_[around].parent) {
      if (scopes_[around].kind != ScopeKind::kFunction) continue;
      if (nearest == kNone) nearest = around;
      if (bound.contains({around, key.name})) {
        binding = around;
        break;
      }
    }
    // Without a function around, which is an error, the name stays where it is.
    declared_[key] = binding != kNone ? binding : nearest != kNone ? nearest : key.scope;
  }
}

uint32_t ScopeNames::DeclaredScope(uint32_t scope, const Record& record) const {
  if (record.info() == kGlobalPrefix || record.info() == kNonlocalPrefix) return scope;
  const auto found = declared_.find({scope, RootOfName(record.name())});
  return found != declared_.end() ? found->second : scope;
}

}  // namespace quillet
