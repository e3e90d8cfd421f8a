// Statements that are told from others of their shape, held against the analysis of each.
//
// The input is a source, of which each line stands three times: as it is, with its names exchanged for others, and
// as it is once more. Records, their places and errors are the same both ways, by tables of shapes that live from
// input to input. The first byte chooses the version.
#include <algorithm>
#include <cctype>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>

#include "foundations/console.h"
#include "tests/core/support/analyzer_helper.h"
#include "tests/core/support/both_ways.h"

namespace quillet {
namespace {

constexpr size_t kMaxInput = 4096;

std::unique_ptr<BothWays> NewBothWays(Version version, bool is_complete) {
  FileAnalyzer::Options options;
  static_cast<CPGenAnalyzerImpl::Options&>(options) = testing::AnalyzerOptions(version);
  options.reads_completely = is_complete;
  return std::make_unique<BothWays>(options);
}

// Other letters, so that words become names and names others of another length.
std::string Renamed(Text line) {
  std::string renamed;
  for (const char c : line) {
    renamed += c;
    if (c == 'a' || c == 'x') renamed += "bcd";
    if (c == 'b') renamed.back() = 'a';
  }
  return renamed;
}

void CheckSource(Text bytes, uint8_t choice) {
  static const std::unique_ptr<BothWays> both[] = {
      NewBothWays(Version::Of(2, 7), false), NewBothWays(Version::Of(3, 12), false),
      NewBothWays(Version::Of(2, 7), true),  NewBothWays(Version::Of(3, 8), true),
      NewBothWays(Version::Of(3, 13), true), NewBothWays(Version::Of(3, 6), true)};
  std::string source;
  for (size_t begin = 0; begin < bytes.size();) {
    const size_t end = std::min(bytes.find('\n', begin), bytes.size() - 1) + 1;
    const Text line = bytes.substr(begin, end - begin);
    source.append(line).append(Renamed(line)).append(line);
    begin = end;
  }
  const std::string different = both[choice % std::size(both)]->Compare(source);
  if (different.empty()) return;
  std::fprintf(stderr, "%s", different.c_str());
  std::abort();
}

}  // namespace
}  // namespace quillet

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  quillet::TheConsole().print_line = [](quillet::Text) {};
  quillet::TheConsole().report_exception = [](const std::exception_ptr&, bool) {};
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0 || size > quillet::kMaxInput) return 0;
  quillet::CheckSource({reinterpret_cast<const char*>(data) + 1, size - 1}, data[0]);
  return 0;
}
