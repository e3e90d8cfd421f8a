// Hints as a complete reading has them: parsed by the parser that knows every form, each failure kept to
// itself.
//
// A failure is noted and the hint dropped, so that whatever else the statement says is recorded. The text of a
// hint keeps its columns in the comment, as everywhere.
#include "foundations/errors.h"
#include "hints/hint_walker.h"
#include "lines/expression_tokens.h"
#include "lines/syntax_error.h"
#include "parser/complete_parser.h"
#include "tokens/byte_scan.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

// The parameters of a function, in order, as the general walker recorded them.
std::vector<Text> NamesOfParameters(const LogicalLine& logical) {
  std::vector<Text> names;
  for (const Record& record : logical.arg_type_equivs())
    if (record.info() == kSetPrefix) names.push_back(record.name());
  return names;
}

}  // namespace

void CTypeHintWalker::ReadCompletely(CompleteParser* parser) {
  complete_parser_ = parser;
  fMaxVisits = INT32_MAX;
  hint_conv_.set_shows_exponents(true);
}

// "ignore", alone or with what behind it is no letter: codes in brackets, a reason.
bool CTypeHintWalker::SaysIgnore(Text hint) {
  constexpr Text kIgnore = "ignore";
  const size_t begin = hint.find_first_not_of(" \t\f");
  if (begin == Text::npos) return false;
  hint = hint.substr(begin);
  return hint.starts_with(kIgnore) && (hint.size() == kIgnore.size() || !IsAsciiIdentifierByte(hint[kIgnore.size()]));
}

void CTypeHintWalker::KeepHintError(int32_t tok_i, int64_t utf8_offset_in_hint, const std::string& message) {
  if (hint_error_) return;
  const Position in_token{0, static_cast<int32_t>(utf8_offset_in_hint)};
  hint_error_ = CreateSyntaxError(message, RequireLogical(), Context::Index(tok_i), &in_token);
}

// The tokens are views of a text of the hint's columns; null where they are no hint.
CNode* CTypeHintWalker::ParseTokensCompletely(TokenSpan toks, int32_t tok_i, bool is_signature) {
  try {
    return is_signature ? complete_parser_->ParseSignature(toks) : complete_parser_->ParseHint(toks);
  } catch (const ParseError& error) {
    const auto index = static_cast<size_t>(std::max(error.context.value, 0));
    const char* const text = toks.front().text;
    const char* const at = index < toks.size() ? toks[index].text : toks.back().end();
    KeepHintError(tok_i, hint_column_ + (at - text),
                  is_signature ? "invalid syntax in signature comment" : "invalid syntax in commented type hint");
    return nullptr;
  }
}

CNode* CTypeHintWalker::ParseHintCompletely(Text hint, int32_t tok_i, bool call_general_node_walker) {
  if (SaysIgnore(hint)) return nullptr;
  const std::vector<Token> toks = TokensOfHint(hint);
  if (toks.empty()) return nullptr;
  CNode* const node = ParseTokensCompletely(toks, tok_i, /*is_signature=*/false);
  if (node == nullptr || !call_general_node_walker) return node;
  try {
    RequireGeneralWalker().Walk(node, fLogical);
  } catch (...) {
    hint_parser_->DiscardNode(node);
    throw;
  }
  return node;
}

// Views of a copy that lives as long as the records.
std::vector<Token> CTypeHintWalker::TokensOfHint(Text hint) {
  if (!hint_source_)
    hint_source_ = SourceText::Copy(hint);
  else
    hint_source_->Assign(hint);
  const Text text = hint_source_->text();
  std::vector<Token> toks;
  AppendExpressionTokens(text.data(), text.data() + text.size(), toks);
  const Text kept = KeepText(hint);
  for (Token& token : toks) token.text = kept.data() + (token.text - text.data());
  hint_column_ = toks.empty() ? 0 : toks.front().text - kept.data();
  return toks;
}

void CTypeHintWalker::ProcessSignatureCompletely(Text hint, int32_t tok_i, LogicalLine* funcdef_logical, bool is_arg) {
  if (SaysIgnore(hint)) return;
  const std::vector<Token> toks = TokensOfHint(hint);
  if (toks.empty()) return;
  CNode* const node = ParseTokensCompletely(toks, tok_i, /*is_signature=*/true);
  if (node == nullptr) return;
  UseHintTree(node, [&] {
    const std::vector<Text> names =
        funcdef_logical != nullptr ? NamesOfParameters(*funcdef_logical) : std::vector<Text>();
    const size_t count = node->ChildCount() - 1;
    // Which leaves the object out that a method belongs to.
    const size_t skipped = in_class && names.size() == count + 1 ? 1 : 0;
    const auto record = [&](Text name, CNode* type_expr) {
      RequireGeneralWalker().Walk(type_expr, fLogical);
      if (GetHintInfoStr(type_expr, info_buffer_)) AddSymInfo(name, info_buffer_, is_arg);
    };
    std::string place;
    for (size_t i = 0; i < count; ++i) {
      if (i + skipped < names.size()) {
        record(names[i + skipped], node->Child(static_cast<uint32_t>(i)));
      } else {
        place.clear();
        AppendArgInfo(static_cast<int64_t>(i), kNoText, place);
        record(place, node->Child(static_cast<uint32_t>(i)));
      }
    }
    record("return", node->LastChild());
  });
}

}  // namespace quillet
