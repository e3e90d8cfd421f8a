// Any bytes to statements and expressions, in four versions, under the checks that hold for all trees, by a
// reader that has read everything before and by a new one.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <string>
#include <vector>

#include "syntax/reader.h"
#include "tests/core/support/verify_syntax.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace quillet;
  constexpr Version kVersions[] = {Version::Of(2, 7), Version::Of(3, 6), Version::Of(3, 12), Version::Of(3, 14)};
  static std::deque<SyntaxReader> readers = [&] {
    std::deque<SyntaxReader> made;
    for (const Version version : kVersions) made.emplace_back(version);
    return made;
  }();
  const Ref<SourceText> source = SourceText::Copy(Text(reinterpret_cast<const char*>(data), size));
  std::vector<LineRow> rows;
  for (size_t i = 0; i < readers.size(); ++i) {
    rows.clear();
    CutLines(*source, kVersions[i], rows);
    const std::string wrong = VerifySyntax(*source, rows, kVersions[i], readers[i]);
    if (wrong.empty()) continue;
    std::fprintf(stderr, "%s, in %d.%d\n", wrong.c_str(), kVersions[i].parts[0], kVersions[i].parts[1]);
    std::abort();
  }
  return 0;
}
