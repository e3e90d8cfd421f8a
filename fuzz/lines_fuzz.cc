// Any bytes to tokens and logical lines, in three versions, under the checks that hold for all of
// them: every byte in one token or gap, every token in one row, codes as of the text alone.
//
// The rows are also analysed for scopes and turned into logical lines whose text is spelled out, so
// that positions are computed for every token.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "lines/cutter.h"
#include "lines/scopes.h"
#include "tests/core/support/verify_tokens.h"

namespace {

void Check(const std::string& wrong) {
  if (wrong.empty()) return;
  std::fprintf(stderr, "%s\n", wrong.c_str());
  std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace quillet;
  const Text bytes(reinterpret_cast<const char*>(data), size);
  const Ref<SourceText> source = SourceText::Copy(bytes);
  for (const Version version : {Version::Of(2, 7), Version::Of(3, 8), Version::Of(3, 12)}) {
    TokenizeOnly(*source, version);
    Check(VerifyTokens(*source));
    std::vector<LineRow> rows;
    CutLines(*source, version, rows);
    Check(VerifyLines(*source, rows));

    ScopeTracker scopes;
    LogicalLine line;
    for (const LineRow& row : rows) {
      LinePlace place;
      scopes.Next(row, place);
      if (place.first_in_def && row.kind == LineKind::kBlankLine) Check("a blank line is the first of a body");
      SetFromRow(line, source, row);
      if (row.token_count > 0 && TextFromTokens(line).empty()) Check("tokens without a text");
      const LineKind soft = FindMatchOrCaseType(line.toks, 0, line.toks.size());
      const bool is_soft = row.kind == LineKind::kMatch || row.kind == LineKind::kCase;
      if (is_soft ? soft != row.kind : soft != LineKind::kUnknown) Check("kind is not that of the tokens");
    }
  }
  return 0;
}
