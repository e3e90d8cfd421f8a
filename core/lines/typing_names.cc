// Imports are told by their first tokens; all but those of the few modules cost one comparison.
#include "lines/typing_names.h"

#include "lines/token_search.h"

namespace quillet {

namespace {

bool IsTypingModule(Text name) { return name == "typing" || name == "typing_extensions"; }

}  // namespace

void TypingNames::Read(const SourceText& source, std::span<const LineRow> rows, std::span<const uint32_t> imports) {
  members_.clear();
  modules_.clear();
  has_star_ = has_renamed_cast_ = false;
  for (const uint32_t index : imports) {
    const LineRow& row = rows[index];
    const TokenSpan toks = TokenSpan(source.tokens).subspan(row.first_token, row.token_count);
    if (row.kind == LineKind::kImport) {
      ReadImport(toks);
    } else if (toks.size() > 3 && IsTypingModule(toks[1].view()) && toks[2].code == word::kImport) {
      ReadFromImport(toks.subspan(3));
    }
  }
}

void TypingNames::ReadImport(TokenSpan toks) {
  for (size_t i = 1; i < toks.size(); ++i) {
    if (!IsTypingModule(toks[i].view()) || toks[i - 1].code == tok::DOT || toks[i - 1].code == word::kAs) continue;
    const bool is_renamed = i + 2 < toks.size() && toks[i + 1].code == word::kAs;
    modules_.insert(toks[is_renamed ? i + 2 : i].view());
  }
}

// `cast, Literal as L`, in brackets or without.
void TypingNames::ReadFromImport(TokenSpan toks) {
  const size_t count = toks.size();
  for (size_t i = NextSignificant(toks, 0, count); i < count; i = NextSignificant(toks, i + 1, count)) {
    if (toks[i].code == tok::STAR) has_star_ = true;
    if (!IsNameCode(toks[i].code)) continue;
    const Text member = toks[i].view();
    Text name = member;
    const size_t as = NextSignificant(toks, i + 1, count);
    if (as < count && toks[as].code == word::kAs) {
      i = NextSignificant(toks, as + 1, count);
      if (i >= count) break;
      name = toks[i].view();
    }
    members_[name] = member;
    has_renamed_cast_ |= member == "cast" && name != "cast";
  }
}

Text TypingNames::MemberOf(Text name) const {
  const auto found = members_.find(name);
  if (found != members_.end()) return found->second;
  return has_star_ ? name : Text("");
}

}  // namespace quillet
