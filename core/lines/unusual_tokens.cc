// What few names ask for.
#include "lines/unusual_tokens.h"

#include "tokens/scanner.h"

namespace quillet {

void UnusualTokens::SeeUnusualName(TokenCode code, const ScanOutput& out) {
  const uint8_t seen = NameOf(code);
  seen_ |= seen;
  // In brackets it may be in a comprehension, and behind the other one in a lambda.
  if ((seen == kYield && out.CodeBefore(2) == tok::LPAR) || (seen == kAwait && (seen_ & kLambda) != 0)) seen_ |= kOther;
}

}  // namespace quillet
