// Declarations are held against what the binder says of their names: the occurrences in front of them in the same
// scope, and the variable around it. What a function yields and returns is read off its rows.
#include "names/scope_rules.h"

#include <algorithm>
#include <string>
#include <utility>

#include "lines/scopes.h"
#include "lines/token_search.h"
#include "names/binder.h"

namespace quillet {

namespace {

using Finding = BlockRules::Finding;
using Use = NameSymbol::Use;

class ScopeRules : public NameRules {
 public:
  explicit ScopeRules(Version version) : version_(version), binder_(version) {}

  void Check(const SourceText& source, std::span<const LineRow> rows, std::vector<Finding>& findings) override {
    source_ = &source;
    rows_ = rows;
    findings_ = &findings;
    const Bindings& names = binder_.Bind(source, rows);
    names_ = &names;
    CheckDeclarations();
    if (!version_.AtLeast(3, 0)) CheckOldScopes();
    CheckGenerators();
  }

 private:
  // A place in the rows.
  struct Place {
    size_t row;
    size_t token;  // of the row
  };
  // What was seen of a name in its scope in front of a declaration.
  struct Seen {
    bool as_parameter = false, read = false, annotated = false, bound = false;
  };

  TokenSpan TokensOf(size_t row) const {
    return TokenSpan(source_->tokens).subspan(rows_[row].first_token, rows_[row].token_count);
  }

  Place PlaceOf(const Occurrence& occurrence) const {
    const char* const at = source_->begin() + occurrence.begin;
    const auto& tokens = source_->tokens;
    const auto token = static_cast<uint32_t>(
        std::ranges::upper_bound(tokens, at, {}, [](const Token& t) { return t.text; }) - tokens.begin() - 1);
    const auto row =
        static_cast<size_t>(std::ranges::upper_bound(rows_, token, {}, &LineRow::first_token) - rows_.begin() - 1);
    return {row, token - rows_[row].first_token};
  }

  void Tell(Place place, std::string message) {
    const auto same_row = [&](const Finding& finding) { return finding.row == place.row; };
    if (std::ranges::any_of(*findings_, same_row)) return;
    findings_->push_back({place.row, SyntaxError::Kind::kSyntax, std::move(message),
                          Context::Index(static_cast<int32_t>(place.token)), /*comes_first=*/false});
  }

  // ---- `global` and `nonlocal` ----

  void CheckDeclarations() {
    const OccurrencesOfSymbols occurrences(*names_);
    for (uint32_t index = 0; index < names_->symbols.size(); ++index) {
      const NameSymbol& symbol = names_->symbols[index];
      if ((symbol.uses & (Use::kGlobalStatement | Use::kNonlocalStatement)) == 0) continue;
      bool is_declared = false;
      for (const uint32_t number : occurrences.Of(index)) {
        const Occurrence& occurrence = names_->occurrences[number];
        // Those of nested scopes belong to the variable, too.
        if (names_->ScopeOf(occurrence) != symbol.scope) continue;
        if (occurrence.role == NameRole::kDeclaration) {
          is_declared = true;
          CheckDeclaration(index, number);
        } else if (is_declared && symbol.scope != 0 && (symbol.uses & Use::kAnnotated) != 0 &&
                   IsAnnotated(occurrence)) {
          const char* const what = (symbol.uses & Use::kGlobalStatement) != 0 ? "global" : "nonlocal";
          Tell(PlaceOf(occurrence),
               "annotated name '" + std::string(names_->TextOf(occurrence)) + "' can't be " + what);
        }
      }
    }
  }

  void CheckDeclaration(uint32_t index, uint32_t declaration) {
    const NameSymbol& symbol = names_->symbols[index];
    Place place = PlaceOf(names_->occurrences[declaration]);
    const TokenSpan toks = TokensOf(place.row);
    while (place.token > 0 && toks[place.token].code != word::kGlobal && toks[place.token].code != word::kNonlocal)
      --place.token;
    const bool is_global = toks[place.token].code == word::kGlobal;
    const char* const what = is_global ? "global" : "nonlocal";
    const std::string name(names_->TextOf(names_->occurrences[declaration]));
    const Seen seen = SeenInFrontOf(declaration);
    if (seen.as_parameter) return Tell(place, "name '" + name + "' is parameter and " + what);
    if (version_.AtLeast(3, 6)) {
      if (seen.read) return Tell(place, "name '" + name + "' is used prior to " + what + " declaration");
      if (seen.annotated) return Tell(place, "annotated name '" + name + "' can't be " + what);
      if (seen.bound) return Tell(place, "name '" + name + "' is assigned to before " + what + " declaration");
    }
    if ((symbol.uses & Use::kGlobalStatement) != 0 && (symbol.uses & Use::kNonlocalStatement) != 0)
      return Tell(place, "name '" + name + "' is nonlocal and global");
    if (is_global || symbol.scope == 0) return;
    if (symbol.variable == index) return Tell(place, "no binding for nonlocal '" + name + "' found");
    if ((names_->symbols[symbol.variable].uses & Use::kTypeParameter) != 0)
      Tell(place, "nonlocal binding not allowed for type parameter '" + name + "'");
  }

  Seen SeenInFrontOf(uint32_t declaration) const {
    Seen seen;
    const uint32_t symbol = names_->occurrences[declaration].place;
    for (uint32_t number = 0; number < declaration; ++number) {
      const Occurrence& occurrence = names_->occurrences[number];
      if (!occurrence.has_symbol || occurrence.place != symbol || occurrence.is_attribute) continue;
      if ((occurrence.flags & (kNameComment | kNameString)) != 0) continue;
      // From 3.14 on none is of the scope it stands in.
      if (version_.AtLeast(3, 14) && (occurrence.flags & kNameAnnotation) != 0) continue;
      switch (occurrence.role) {
        case NameRole::kRead:
        case NameRole::kCall:
          seen.read = true;
          break;
        case NameRole::kDefinition:
        case NameRole::kWrite:
        case NameRole::kDelete:
          if (occurrence.kind == NameKind::kParameter)
            seen.as_parameter = true;
          else if (IsAnnotated(occurrence))
            seen.annotated = true;
          else
            seen.bound = true;
          break;
        default:
          // An import leaves the name free to be declared.
          break;
      }
    }
    return seen;
  }

  bool IsAnnotated(const Occurrence& occurrence) const {
    const Place place = PlaceOf(occurrence);
    const TokenSpan toks = TokensOf(place.row);
    return rows_[place.row].kind == LineKind::kAssignment && place.token == 0 && toks.size() > 1 &&
           toks[1].code == tok::COLON;
  }

  // ---- 2.7 ----

  // Names of a function that are not known when it is compiled, and nested functions that ask for some.
  void CheckOldScopes() {
    const std::vector<bool> asks = ScopesThatAsk();
    ScopeTracker tracker;
    for (size_t row = 0; row < rows_.size(); ++row) {
      LinePlace place;
      tracker.Next(rows_[row], place);
      if (place.depth == 0 || rows_[row].token_count == 0) continue;
      const TokenSpan toks = TokensOf(row);
      const bool is_star = rows_[row].kind == LineKind::kFromImport && LastCode(toks) == tok::STAR;
      const bool is_exec = toks[0].code == word::kExec && !HoldsIn(toks);
      if (!is_star && !is_exec) continue;
      const uint32_t scope = ScopeAt(toks[0].text);
      if (names_->scopes[scope].kind != NameScopeKind::kFunction || !asks[scope]) continue;
      const std::string what = is_star ? "import * is not allowed" : "unqualified exec is not allowed";
      Tell({row, 0}, what + " in function '" + std::string(names_->NameOf(names_->scopes[scope])) +
                         "' because it contains a nested function with free variables");
    }
    CheckDeleted();
  }

  void CheckDeleted() {
    std::vector<bool> is_free_within(names_->symbols.size());
    for (uint32_t index = 0; index < names_->symbols.size(); ++index) {
      const NameSymbol& symbol = names_->symbols[index];
      if (symbol.resolution == NameSymbol::Resolution::kFree && symbol.variable != index)
        is_free_within[symbol.variable] = true;
    }
    for (const Occurrence& occurrence : names_->occurrences) {
      if (occurrence.role != NameRole::kDelete || !occurrence.has_symbol || !is_free_within[occurrence.place]) continue;
      Tell(PlaceOf(occurrence),
           "can not delete variable '" + std::string(names_->TextOf(occurrence)) + "' referenced in nested scope");
    }
  }

  // Of each scope whether one inside of it, or it itself inside of another function, uses a name that it does not bind.
  std::vector<bool> ScopesThatAsk() const {
    const auto& scopes = names_->scopes;
    std::vector<bool> asks(scopes.size());
    for (uint32_t scope = static_cast<uint32_t>(scopes.size()); scope-- > 1;) {
      bool is_nested = false;
      for (uint32_t around = scopes[scope].parent; around != 0 && around != kNoIndex; around = scopes[around].parent)
        is_nested |= scopes[around].kind != NameScopeKind::kClass;
      for (uint32_t symbol = scopes[scope].first_symbol; symbol != kNoIndex && is_nested;
           symbol = names_->symbols[symbol].next) {
        const NameSymbol::Resolution resolution = names_->symbols[symbol].resolution;
        if (names_->symbols[symbol].uses != 0 &&
            (resolution == NameSymbol::Resolution::kFree || resolution == NameSymbol::Resolution::kImplicitGlobal))
          asks[scope] = true;
      }
      if (asks[scope]) asks[scopes[scope].parent] = true;
    }
    return asks;
  }

  uint32_t ScopeAt(const char* at) const {
    const auto offset = static_cast<uint32_t>(at - source_->begin());
    uint32_t found = 0;
    for (uint32_t scope = 1; scope < names_->scopes.size(); ++scope) {
      const NameScope& candidate = names_->scopes[scope];
      if (candidate.kind != NameScopeKind::kFunction && candidate.kind != NameScopeKind::kClass) continue;
      if (candidate.begin <= offset && offset < candidate.end) found = scope;
    }
    return found;
  }

  static TokenCode LastCode(TokenSpan toks) {
    for (size_t i = toks.size(); i-- > 0;)
      if (!IsSkipCode(toks[i].code)) return toks[i].code;
    return tok::ENDMARKER;
  }

  // `exec code in names`, and `exec(code, names)`, say where the names are.
  static bool HoldsIn(TokenSpan toks) {
    if (toks.size() > 1 && toks[1].code == tok::LPAR) {
      size_t depth = 0;
      for (const Token& token : toks) {
        if (IsOpeningBracket(token.code)) ++depth;
        if (IsClosingBracket(token.code) && depth > 0) --depth;
        if (depth == 1 && token.code == tok::COMMA) return true;
      }
    }
    return std::ranges::any_of(toks, [](const Token& token) { return token.code == word::kIn; });
  }

  // ---- generators ----

  struct Function {
    bool is_def;
    bool yields = false;
    size_t returns_row = SIZE_MAX;  // the first one with a value
  };

  // In 2.7 no generator returns a value, later on none that is `async`.
  void CheckGenerators() {
    const bool is_old = !version_.AtLeast(3, 0);
    ScopeTracker tracker;
    std::vector<Function> open;
    const auto close = [&](size_t depth) {
      for (; open.size() > depth; open.pop_back()) {
        const Function& function = open.back();
        if (!function.is_def || !function.yields || function.returns_row == SIZE_MAX) continue;
        Tell({function.returns_row, ReturnIn(TokensOf(function.returns_row))},
             is_old ? "'return' with argument inside generator" : "'return' with value in async generator");
      }
    };
    for (size_t row = 0; row < rows_.size(); ++row) {
      const LineKind kind = rows_[row].kind;
      if (kind == LineKind::kBlankLine || kind == LineKind::kComment) continue;
      LinePlace place;
      tracker.Next(rows_[row], place);
      close(place.depth);
      const TokenSpan toks = TokensOf(row);
      if (!open.empty() && place.in_def) {
        Function& function = open.back();
        function.yields |= Yields(toks);
        const size_t at = ReturnIn(toks);
        const size_t value = NextSignificant(toks, at + 1, toks.size());
        if (at < toks.size() && value < toks.size() && function.returns_row == SIZE_MAX) function.returns_row = row;
      }
      const bool is_def = kind == LineKind::kFunctionDef && (is_old || rows_[row].is_async);
      if (kind == LineKind::kFunctionDef || kind == LineKind::kClassDef) open.push_back({is_def});
    }
    close(0);
  }

  static size_t ReturnIn(TokenSpan toks) {
    size_t at = 0;
    while (at < toks.size() && toks[at].code != word::kReturn) ++at;
    return at;
  }

  // Without one that may be that of a lambda or of a generator expression.
  static bool Yields(TokenSpan toks) {
    bool has_own = false;
    size_t depth = 0;
    for (const Token& token : toks) {
      if (IsOpeningBracket(token.code)) ++depth;
      if (IsClosingBracket(token.code) && depth > 0) --depth;
      if (token.code == word::kLambda || (token.code == word::kFor && depth > 0)) return false;
      has_own |= token.code == word::kYield;
    }
    return has_own;
  }

  const Version version_;
  NameBinder binder_;
  const SourceText* source_ = nullptr;
  std::span<const LineRow> rows_;
  const Bindings* names_ = nullptr;
  std::vector<Finding>* findings_ = nullptr;
};

}  // namespace

std::unique_ptr<NameRules> MakeScopeRules(Version version) { return std::make_unique<ScopeRules>(version); }

}  // namespace quillet
