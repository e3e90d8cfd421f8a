// Two passes over the bindings: the first finds what each variable is, the second copies what is shown.
#include "site/occurrences.h"

#include <algorithm>

#include "foundations/utf8.h"

namespace quillet {

namespace {

// What is said of one name holds at most so many bytes.
constexpr size_t kMostFacts = 240;
// A dotted name holds at most so many bytes; what would have a longer one keeps that of the scope around it.
constexpr size_t kMostDottedName = 400;

bool Opens(NameKind kind) {
  return kind == NameKind::kClass || kind == NameKind::kFunction || kind == NameKind::kTypeAlias;
}

bool Binds(const Occurrence& occurrence) {
  return occurrence.role == NameRole::kDefinition || occurrence.role == NameRole::kWrite ||
         occurrence.role == NameRole::kImport;
}

bool IsOpened(const Occurrence& occurrence) {
  return occurrence.role == NameRole::kDefinition && Opens(occurrence.kind);
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
  for (const char c : {'\n', '\r'}) end -= end > BeginOf(line) && source_.begin()[end - 1] == c;
  return end;
}

uint32_t ShownPart::ShownEndOf(uint32_t line) const {
  uint32_t end = EndOf(line);
  if (end - BeginOf(line) <= kMostBytesOfLine) return end;
  end = BeginOf(line) + kMostBytesOfLine;
  for (int i = 0; i < 3 && !IsUtf8LeadByte(source_.begin()[end]); ++i) --end;
  return end;
}

// ---- what is named ----

void SiteOccurrences::Collect(const FileAnalyzer& file, const ShownPart& shown) {
  const Bindings& bindings = binder_.Bind(file.source(), file.rows());
  occurrences_.clear();
  scope_of_.clear();
  text_of_.clear();
  definitions_.clear();
  attributes_.clear();
  dotted_names_.assign(bindings.scopes.size(), kNoText);
  texts_.Reset();
  FindVariables(bindings);
  uint32_t line = 0;
  for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
    const Occurrence& occurrence = bindings.occurrences[i];
    while (line + 1 < shown.line_count() && shown.BeginOf(line + 1) <= occurrence.begin) ++line;
    if (line >= shown.shown_lines()) break;
    if (shown.Shows(line, bindings.EndOf(occurrence))) Add(bindings, i, line);
  }
  FindDefinitions(bindings);
}

void SiteOccurrences::FindVariables(const Bindings& bindings) {
  variables_.assign(bindings.symbols.size(), {});
  for (uint32_t i = 0; i < bindings.symbols.size(); ++i) {
    const NameScope& scope = bindings.scopes[bindings.symbols[i].scope];
    variables_[i].is_shared = scope.kind == NameScopeKind::kModule || scope.kind == NameScopeKind::kClass;
  }
  for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
    const Occurrence& occurrence = bindings.occurrences[i];
    const uint32_t number = bindings.VariableOf(occurrence);
    if (number == kNoIndex || !Binds(occurrence)) continue;
    Variable& variable = variables_[number];
    if (occurrence.kind == NameKind::kImport) variable.is_imported = true;
    const bool is_better =
        variable.binding == kNoIndex || (IsOpened(occurrence) && !IsOpened(bindings.occurrences[variable.binding]));
    if (is_better) variable.binding = i;
  }
  if (!bindings.scopes.empty() && bindings.scopes.front().has_star_import) {
    for (uint32_t i = 0; i < bindings.symbols.size(); ++i) {
      if (variables_[i].binding == kNoIndex && bindings.symbols[i].scope == 0) variables_[i].is_imported = true;
    }
  }
}

void SiteOccurrences::Add(const Bindings& bindings, uint32_t index, uint32_t line) {
  const Occurrence& occurrence = bindings.occurrences[index];
  const uint32_t number = bindings.VariableOf(occurrence);
  SiteOccurrence added{occurrence.begin,
                       static_cast<uint32_t>(bindings.TextOf(occurrence).size()),
                       line,
                       number,
                       kNoIndex,
                       occurrence.role,
                       occurrence.kind,
                       occurrence.is_attribute != 0};
  if (added.kind == NameKind::kImport) {
    added.role = NameRole::kImport;
  } else if (number != kNoIndex && variables_[number].binding == index) {
    added.role = NameRole::kDefinition;
  } else if (added.role == NameRole::kWrite) {
    added.kind = NameKind::kNone;
  }
  if (added.is_attribute) {
    const uint32_t receiver = bindings.ReceiverOf(index);
    if (receiver != kNoIndex) added.receiver = bindings.VariableOf(bindings.occurrences[receiver]);
  }
  if (number != kNoIndex) {
    Variable& variable = variables_[number];
    if (variable.binding == kNoIndex && !variable.is_imported) return;  // the language's own
    if (variable.binding == index) variable.definition = static_cast<uint32_t>(occurrences_.size());
  }
  occurrences_.push_back(added);
  scope_of_.push_back(bindings.ScopeOf(occurrence));
  text_of_.push_back(occurrence.text);
}

void SiteOccurrences::FindDefinitions(const Bindings& bindings) {
  for (uint32_t i = 0; i < occurrences_.size(); ++i) {
    const SiteOccurrence& occurrence = occurrences_[i];
    if (occurrence.role == NameRole::kDefinition && Opens(occurrence.kind)) {
      AddDefinition(bindings, i, scope_of_[i]);
    } else if (occurrence.role == NameRole::kDefinition && occurrence.kind == NameKind::kVariable) {
      if (variables_[occurrence.variable].is_shared)
        AddDefinition(bindings, i, bindings.symbols[occurrence.variable].scope);
    } else if (occurrence.is_attribute && occurrence.role == NameRole::kWrite && occurrence.receiver != kNoIndex) {
      // The first place that sets an attribute of the object itself.
      const NameSymbol& receiver = bindings.symbols[occurrence.receiver];
      const Text name = bindings.texts[receiver.name];
      if (!bindings.IsParameter(receiver) || (name != "self" && name != "cls")) continue;
      const uint32_t around = ClassAround(bindings, receiver.scope);
      if (around == kNoIndex) continue;
      const uint64_t key = uint64_t{around} << 32 | text_of_[i];
      if (attributes_.insert(key).second) AddDefinition(bindings, i, around);
    }
  }
}

void SiteOccurrences::AddDefinition(const Bindings& bindings, uint32_t occurrence, uint32_t scope) {
  definitions_.push_back({occurrence, DottedNameOf(bindings, scope)});
}

// The class whose method a function's scope is; kNoIndex without one.
uint32_t SiteOccurrences::ClassAround(const Bindings& bindings, uint32_t scope) const {
  scope = bindings.scopes[scope].parent;
  while (scope != kNoIndex && bindings.scopes[scope].kind == NameScopeKind::kTypeParameters)
    scope = bindings.scopes[scope].parent;
  return scope != kNoIndex && bindings.scopes[scope].kind == NameScopeKind::kClass ? scope : kNoIndex;
}

Text SiteOccurrences::DottedNameOf(const Bindings& bindings, uint32_t scope) {
  // Up to a scope whose name is known, and back down.
  while (IsNone(dotted_names_[scope])) {
    chain_.push_back(scope);
    if (bindings.scopes[scope].parent == kNoIndex) break;
    scope = bindings.scopes[scope].parent;
  }
  Text outer = IsNone(dotted_names_[scope]) ? Text("") : dotted_names_[scope];
  for (; !chain_.empty(); chain_.pop_back()) {
    const NameScope& inner = bindings.scopes[chain_.back()];
    const bool is_named = inner.kind == NameScopeKind::kClass || inner.kind == NameScopeKind::kFunction;
    if (is_named && inner.name != kNoIndex) {
      const Text name = bindings.texts[inner.name];
      if (outer.size() + 1 + name.size() <= kMostDottedName) {
        buffer_.assign(outer);
        if (!outer.empty()) buffer_ += '.';
        buffer_ += name;
        outer = texts_.Copy(buffer_);
      }
    }
    dotted_names_[chain_.back()] = outer;
  }
  return outer;
}

// ---- what is known ----

void SiteFacts::Collect(const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
                        const ShownPart& shown) {
  facts_.clear();
  modules_.clear();
  placed.Begin(file, scopes);
  for (size_t row = 0; row < file.rows().size() && file.rows()[row].first_line < shown.shown_lines(); ++row) {
    for (const PlacedRecord& record : placed.OfRow(row)) {
      const uint32_t line = record.line - 1;
      if (record.detail.empty() || line >= shown.shown_lines()) continue;
      // A name with dots is known by its last one.
      const uint32_t begin = shown.BeginOf(line) + record.column - 1;
      const auto size = static_cast<uint32_t>(record.name.size());
      if (!shown.Shows(line, begin + size) || file.source().text().substr(begin, size) != record.name) continue;
      const size_t dot = record.name.rfind('.');
      Add(record, dot == Text::npos ? begin : begin + static_cast<uint32_t>(dot) + 1);
    }
  }
}

void SiteFacts::Add(const PlacedRecord& record, uint32_t begin) {
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
  if (record.kind == RecordKind::kImport || record.kind == RecordKind::kFromImport)
    modules_.emplace(begin, record.detail.substr(0, record.detail.find(' ')));
  std::string fact(word);
  fact += record.detail;
  // The module, a blank, and the name there.
  if (const size_t blank = fact.rfind(' '); record.kind == RecordKind::kFromImport && blank > word.size())
    fact.replace(blank, 1, " import ");
  std::string& facts = facts_[begin];
  if (facts.size() + fact.size() > kMostFacts || facts.find(fact) != std::string::npos) return;
  if (record.kind == RecordKind::kHint)
    facts = facts.empty() ? fact : fact + "  " + facts;
  else
    facts += facts.empty() ? fact : "  " + fact;
}

Text SiteFacts::ModuleAt(uint32_t begin) const {
  const auto module = modules_.find(begin);
  return module != modules_.end() ? Text(module->second) : Text();
}

Text SiteFacts::At(uint32_t begin) const {
  const auto facts = facts_.find(begin);
  return facts != facts_.end() ? Text(facts->second) : Text();
}

}  // namespace quillet
