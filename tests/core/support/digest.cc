// quillet_digest: what the core says of sources, as one number a stage (digest.h).
//
//   quillet_digest PATH...             of files, and folders with all that lies below them, all of them together
//   quillet_digest --show STAGE FILE   the text behind a number of the table of shipped sources
//   quillet_digest --write             writes that table (shipped_digests.h)
//
// Of the first, each file is taken as it is and spoilt in two ways, as 2.7, 3.8 and 3.12, and a workspace with a small
// library is asked about it. scripts/mutate.py asks that about changes that no test noticed. What two builds show of a
// file may be compared by any tool that compares texts.
#include "tests/core/support/digest.h"

#include <cstdio>
#include <cstring>
#include <fstream>
#include <string>
#include <vector>

#include "tests/core/support/shipped_digests.h"

namespace quillet::testing {
namespace {

std::vector<std::filesystem::path> FilesOf(int argc, char** argv) {
  std::vector<std::filesystem::path> files;
  for (int i = 1; i < argc; ++i) {
    if (!std::filesystem::is_directory(argv[i])) {
      files.emplace_back(argv[i]);
      continue;
    }
    for (const auto& entry : std::filesystem::recursive_directory_iterator(argv[i]))
      if (entry.is_regular_file()) files.push_back(entry.path());
  }
  std::sort(files.begin(), files.end());
  return files;
}

int DigestAll(const std::vector<std::filesystem::path>& files) {
  Digests digests;
  const Version versions[] = {Version::Of(3, 12), Version::Of(3, 8), Version::Of(2, 7)};
  SourcesDigest sources(versions, digests);
  AnswersDigest answers(Version::Of(3, 12), digests.answers);
  answers.Write("b.py", kOtherModule);
  for (const std::filesystem::path& path : files) {
    const std::string bytes = BytesOf(path);
    sources.Add(bytes, 2);
    sources.AddRows({bytes});
    sources.AddProject(bytes);
    for (const std::string& text : {bytes, Spoilt(bytes, 1)}) {
      answers.Open("a.py", text);
      answers.AddFile("a.py", 30);
    }
  }
  std::printf("%zu files", files.size());
  for (const auto& [name, digest] : digests.Stages())
    std::printf("  %s %016llx", name, static_cast<unsigned long long>(digest->value()));
  std::printf("\n");
  return 0;
}

int Show(const std::string& stage, const std::string& path) {
  const std::vector<ShippedSource> all = ShippedSources();
  Digests digests;
  std::string shown;
  bool is_stage = false;
  for (const auto& [name, digest] : digests.Stages()) {
    if (name != stage) continue;
    digest->ShowIn(shown);
    is_stage = true;
  }
  const auto source = std::ranges::find(all, path, &ShippedSource::path);
  if (!is_stage || source == all.end()) {
    std::fprintf(stderr, "quillet_digest: no such %s\n", is_stage ? "file in the table" : "stage");
    return 2;
  }
  AddShipped(*source, all, digests);
  std::fwrite(shown.data(), 1, shown.size(), stdout);
  return 0;
}

int Write() {
  const std::vector<ShippedSource> all = ShippedSources();
  std::string table = DigestHead() + "\n";
  for (const ShippedSource& source : all) table += DigestLine(source, all) + "\n";
  std::ofstream out(kDigestTable, std::ios::binary);
  out << table;
  return out ? 0 : 1;
}

}  // namespace
}  // namespace quillet::testing

int main(int argc, char** argv) {
  using namespace quillet::testing;
  if (argc == 4 && std::strcmp(argv[1], "--show") == 0) return Show(argv[2], argv[3]);
  if (argc == 2 && std::strcmp(argv[1], "--write") == 0) return Write();
  return DigestAll(FilesOf(argc, argv));
}
