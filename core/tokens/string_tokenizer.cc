// A client of the scanner that keeps nothing but the tokens.
#include "tokens/string_tokenizer.h"

#include "tokens/scanner.h"

namespace quillet {

namespace {

// What the scanner may load behind the text; see scanner.h.
constexpr size_t kPadding = 32;

}  // namespace

CStringTokenizer::CStringTokenizer(Text utf8_bytes) {
  bytes_.reserve(utf8_bytes.size() + kPadding);
  bytes_ = utf8_bytes;
  bytes_.append(kPadding, '\0');
  end_ = bytes_.data() + utf8_bytes.size();
  std::vector<uint32_t> line_starts;
  TokensOnly client;
  // Formatted strings are read by the rules of 3.12, which take all that older ones take.
  Scanner<TokensOnly>(Text(bytes_.data(), utf8_bytes.size()), true, tokens_, line_starts, client).Run();
}

void CStringTokenizer::Advance() {
  if (AtEnd()) return;
  switch (CurrentCode()) {
    case tok::LPAR:
    case tok::LSQB:
    case tok::LBRACE:
      ++bracket_depth_;
      break;
    case tok::RPAR:
    case tok::RSQB:
    case tok::RBRACE:
      if (bracket_depth_ > 0) --bracket_depth_;
      break;
    default:
      break;
  }
  ++index_;
}

}  // namespace quillet
