// What holds for the bindings of any bytes: occurrences stand in order where their text stands, each name
// token has one, and scopes, symbols and owners fit together.
#pragma once

#include <algorithm>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "lines/cutter.h"
#include "names/binder.h"

namespace quillet {

namespace verify_names {

inline std::string At(const char* what, size_t index) { return std::string(what) + " " + std::to_string(index); }

inline std::string VerifyScopes(const SourceText& source, const Bindings& bindings) {
  if (bindings.scopes.empty() || bindings.scopes[0].kind != NameScopeKind::kModule) return "no module";
  std::vector<uint8_t> is_seen(bindings.symbols.size());
  size_t seen = 0;
  for (size_t i = 0; i < bindings.scopes.size(); ++i) {
    const NameScope& scope = bindings.scopes[i];
    if (i == 0 ? scope.parent != kNoIndex : scope.parent >= i) return At("parent of scope", i);
    if (scope.begin > scope.end || scope.end > source.size()) return At("range of scope", i);
    if (i > 0 && scope.begin < bindings.scopes[scope.parent].begin) return At("begin of nested scope", i);
    if (scope.name != kNoIndex && scope.name >= bindings.texts.size()) return At("name of scope", i);
    size_t count = 0;
    for (uint32_t s = scope.first_symbol; s != kNoIndex; s = bindings.symbols[s].next) {
      if (s >= bindings.symbols.size() || is_seen[s] || bindings.symbols[s].scope != i)
        return At("symbols of scope", i);
      is_seen[s] = 1;
      ++count;
    }
    if (count != scope.symbol_count) return At("number of symbols of scope", i);
    seen += count;
  }
  if (QualifiedNames(bindings).size() != bindings.scopes.size()) return "a scope has no qualified name";
  return seen == bindings.symbols.size() ? "" : "a symbol is in no scope";
}

inline std::string VerifySymbols(const Bindings& bindings) {
  using Resolution = NameSymbol::Resolution;
  std::vector<std::pair<uint32_t, uint32_t>> names;
  for (size_t i = 0; i < bindings.symbols.size(); ++i) {
    const NameSymbol& symbol = bindings.symbols[i];
    if (symbol.name >= bindings.texts.size() || symbol.variable >= bindings.symbols.size()) return At("symbol", i);
    const NameSymbol& owner = bindings.symbols[symbol.variable];
    if (owner.name != symbol.name) return At("another name owns symbol", i);
    if (owner.variable != symbol.variable) return At("an owner that owns nothing: symbol", i);
    if (symbol.resolution == Resolution::kLocal && symbol.variable != i) return At("a local of others: symbol", i);
    if (symbol.resolution == Resolution::kExplicitGlobal && owner.scope != 0) return At("global symbol", i);
    uint32_t around = symbol.scope;
    // Deep sources are many, and the way out is long.
    for (int step = 0; around != owner.scope && around != kNoIndex && step < 1000; ++step)
      around = bindings.scopes[around].parent;
    if (around == kNoIndex) return At("the owner is not around symbol", i);
    if (symbol.uses != 0 && bindings.texts[symbol.name] != "__class__") names.push_back({symbol.scope, symbol.name});
  }
  std::sort(names.begin(), names.end());
  return std::adjacent_find(names.begin(), names.end()) == names.end() ? "" : "a scope has two symbols of a name";
}

inline std::string VerifyOccurrences(const SourceText& source, const Bindings& bindings) {
  uint32_t behind = 0;
  for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
    const Occurrence& occurrence = bindings.occurrences[i];
    if (occurrence.text >= bindings.texts.size()) return At("text of occurrence", i);
    const Text text = bindings.TextOf(occurrence);
    if (text.empty() || occurrence.begin < behind || bindings.EndOf(occurrence) > source.size())
      return At("range of occurrence", i);
    behind = bindings.EndOf(occurrence);
    if (source.text().substr(occurrence.begin, text.size()) != text) return At("another text at occurrence", i);
    if (occurrence.receiver_distance > i) return At("receiver of occurrence", i);
    if (occurrence.has_symbol ? occurrence.place >= bindings.symbols.size()
                              : occurrence.place >= bindings.scopes.size())
      return At("place of occurrence", i);
    if (occurrence.has_symbol && (occurrence.is_attribute || occurrence.role == NameRole::kKeyword))
      return At("symbol of occurrence", i);
    if (!occurrence.has_symbol && occurrence.kind != NameKind::kNone) return At("kind of occurrence", i);
    if (!occurrence.is_attribute && occurrence.receiver_distance != 0) return At("receiver of no attribute", i);
    const bool binds = occurrence.role == NameRole::kDefinition || occurrence.role == NameRole::kWrite;
    if (occurrence.has_symbol && binds != (occurrence.kind != NameKind::kNone) && occurrence.role != NameRole::kImport)
      return At("kind and role of occurrence", i);
  }
  return "";
}

// Each name token has an occurrence, and each occurrence is a name token or stands in a string or comment.
inline std::string VerifyTokensHaveNames(const SourceText& source, std::span<const LineRow> rows, Version version,
                                         const Bindings& bindings) {
  size_t next = 0;
  for (const LineRow& row : rows) {
    const char* template_begin = nullptr;  // the prefix of a template string, whose fields may hold any token
    for (uint32_t i = row.first_token; i < row.first_token + row.token_count; ++i) {
      const Token& token = source.tokens[i];
      const auto begin = static_cast<uint32_t>(token.text - source.begin());
      const bool is_name = token.code == tok::NAME || token.code == word::kCast;
      if (is_name) {
        const bool is_prefix = version.AtLeast(3, 14) && i + 1 < row.first_token + row.token_count &&
                               source.tokens[i + 1].code == tok::STRING && source.tokens[i + 1].text == token.end();
        if (next >= bindings.occurrences.size() || bindings.occurrences[next].begin != begin) {
          if (is_prefix && template_begin == nullptr) template_begin = token.text;
          if (template_begin != nullptr) continue;
          return "no occurrence of the token " + std::string(token.view());
        }
        if (bindings.TextOf(bindings.occurrences[next]) != token.view()) return At("text of token", i);
        ++next;
        continue;
      }
      for (; next < bindings.occurrences.size(); ++next) {
        if (bindings.occurrences[next].begin >= begin + token.length) break;
        const bool holds_names = token.code == tok::STRING || token.code == tok::COMMENT || IsNameCode(token.code);
        if (template_begin == nullptr && (!holds_names || bindings.occurrences[next].begin < begin))
          return At("no name at occurrence", next);
      }
    }
  }
  return next == bindings.occurrences.size() ? "" : "occurrences behind the last token";
}

inline std::string VerifySame(const Bindings& a, const Bindings& b) {
  if (a.occurrences.size() != b.occurrences.size()) return "another number of occurrences";
  if (a.scopes.size() != b.scopes.size() || a.symbols.size() != b.symbols.size()) return "other scopes or symbols";
  if (a.texts.bytes != b.texts.bytes || a.texts.offsets != b.texts.offsets) return "other texts";
  for (size_t i = 0; i < a.occurrences.size(); ++i) {
    const Occurrence& left = a.occurrences[i];
    const Occurrence& right = b.occurrences[i];
    if (left.begin != right.begin || left.text != right.text || left.place != right.place || left.role != right.role ||
        left.kind != right.kind || left.flags != right.flags || left.has_symbol != right.has_symbol ||
        left.receiver_distance != right.receiver_distance) {
      return At("another occurrence", i);
    }
  }
  for (size_t i = 0; i < a.symbols.size(); ++i) {
    const NameSymbol& left = a.symbols[i];
    const NameSymbol& right = b.symbols[i];
    if (left.scope != right.scope || left.variable != right.variable || left.uses != right.uses ||
        left.resolution != right.resolution || left.is_listed != right.is_listed) {
      return At("another symbol", i);
    }
  }
  return "";
}

}  // namespace verify_names

// What is wrong with the bindings of a source that was cut; empty where nothing is. `binder` is of this
// version, and may have been used.
inline std::string VerifyNames(const SourceText& source, std::span<const LineRow> rows, Version version,
                               NameBinder& binder) {
  const Bindings& bindings = binder.Bind(source, rows);
  std::string wrong = verify_names::VerifyScopes(source, bindings);
  if (wrong.empty()) wrong = verify_names::VerifySymbols(bindings);
  if (wrong.empty()) wrong = verify_names::VerifyOccurrences(source, bindings);
  if (wrong.empty()) wrong = verify_names::VerifyTokensHaveNames(source, rows, version, bindings);
  NameBinder fresh(version);
  if (wrong.empty()) wrong = verify_names::VerifySame(bindings, fresh.Bind(source, rows));
  return wrong;
}

}  // namespace quillet
