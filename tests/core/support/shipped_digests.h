// The digests of every source that comes with the tests, as tests/digests.txt holds them: a line a source, a
// column a stage.
//
// Sources are the files of the fuzz corpus, the examples, the statements of the golden files, the programs below
// tests/programs, each folder of which is one, and families of sources that are made (made_sources.h), all of a family
// in one line. What a workspace answers about a program's file is asked with all of them there. A program whose name
// ends in "_27" is read as Python 2.7.
#pragma once

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <sstream>
#include <string>
#include <vector>

#include "tests/core/support/digest.h"
#include "tests/core/support/made_sources.h"

namespace quillet::testing {

inline const std::string kDigestTable = QUILLET_SOURCE_DIR "/tests/digests.txt";

struct ShippedSource {
  std::string path;                    // from the root of the repository; of a family, its name
  std::string program;                 // the folder of its program; empty for a file by itself
  const MadeFamily* family = nullptr;  // that it is, if it is one
};

// In the order of their paths, families behind files.
inline std::vector<ShippedSource> ShippedSources() {
  const std::filesystem::path root = QUILLET_SOURCE_DIR;
  std::vector<ShippedSource> sources;
  for (const char* folder : {"examples", "fuzz/corpus", "tests/golden", "tests/programs"}) {
    if (!std::filesystem::is_directory(root / folder)) continue;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root / folder)) {
      const std::string path = entry.path().lexically_relative(root).generic_string();
      if (!entry.is_regular_file() || path.find("/__pycache__/") != std::string::npos) continue;
      std::string program;
      if (path.starts_with("tests/programs/")) program = path.substr(0, path.find('/', sizeof "tests/programs/"));
      sources.push_back({path, program == path ? "" : program});
    }
  }
  std::ranges::sort(sources, {}, &ShippedSource::path);
  for (const MadeFamily& family : MadeFamilies()) sources.push_back({std::string("made/") + family.name, {}, &family});
  return sources;
}

// The bytes of a source; of a golden file the statements alone.
inline std::string BytesOf(const ShippedSource& source) {
  std::string bytes = BytesOf(std::filesystem::path(QUILLET_SOURCE_DIR) / source.path);
  if (!source.path.starts_with("tests/golden/")) return bytes;
  std::istringstream lines(bytes);
  bool is_statement = false;
  bytes.clear();
  for (std::string line; std::getline(lines, line);) {
    const bool is_head = line.starts_with("=== ");
    if (is_head || line.starts_with("--- ")) is_statement = is_head;
    if (is_statement && !is_head) bytes += line + "\n";
  }
  return bytes;
}

// What is said of sources by themselves, as versions from 2.7 to 3.14.
class SeveralVersions {
 public:
  explicit SeveralVersions(Digests& digests) : ends_(kEnds, digests), between_(kBetween, digests) {}
  void Add(const std::string& bytes) {
    ends_.Add(bytes, 1);
    ends_.AddProject(bytes);
    between_.Add(bytes, 0);
  }
  void AddRows(const std::vector<std::string>& sources) { ends_.AddRows(sources); }

 private:
  static inline const Version kEnds[] = {Version::Of(3, 14), Version::Of(2, 7)};
  static inline const Version kBetween[] = {Version::Of(3, 8), Version::Of(3, 6)};
  SourcesDigest ends_, between_;
};

inline Version VersionOfProgram(const std::string& name) {
  return name.ends_with("_27") ? Version::Of(2, 7) : Version::Of(3, 14);
}

inline void AddFamily(const MadeFamily& family, Digests& digests) {
  const Version newest[] = {Version::Of(3, 14)};
  SourcesDigest long_ones(newest, digests);
  SeveralVersions others(digests);
  AnswersDigest answers(VersionOfProgram(family.name), digests.answers);
  answers.Write("b.py", kOtherModule);
  std::vector<std::string> sources;
  for (const MadeProgram& program : family.Make()) {
    for (const auto& [path, bytes] : program) {
      if (family.is_long) {
        long_ones.Add(bytes, 0);
      } else {
        others.Add(bytes);
        sources.push_back(bytes);
      }
      answers.Open(path, bytes);
    }
    for (const auto& [path, bytes] : program) answers.AddFile(path, family.places);
  }
  others.AddRows(sources);
}

inline void AddShipped(const ShippedSource& source, const std::vector<ShippedSource>& all, Digests& digests) {
  if (source.family != nullptr) return AddFamily(*source.family, digests);
  const std::string bytes = BytesOf(source);
  SeveralVersions by_itself(digests);
  by_itself.Add(bytes);
  by_itself.AddRows({bytes});
  const Version version = VersionOfProgram(source.program);
  AnswersDigest answers(version, digests.answers);
  if (source.program.empty()) {
    answers.Write("b.py", kOtherModule);
    answers.Open("a.py", bytes);
    answers.AddFile("a.py", 12);
    return;
  }
  const size_t folder = source.program.size() + 1;
  AnswersDigest with_little(version, digests.answers, AnswersDigest::Memory::kLittle);
  for (const ShippedSource& other : all) {
    if (other.program != source.program) continue;
    answers.Write(other.path.substr(folder), BytesOf(other));
    with_little.Write(other.path.substr(folder), BytesOf(other));
  }
  const std::string path = source.path.substr(folder);
  answers.AddFile(path, 50);
  answers.AddEdits(path);
  with_little.AddFile(path, 3);
  // Once a program.
  if (std::ranges::find(all, source.program, &ShippedSource::program)->path == source.path) answers.AddProgram();
}

// A line of the table, and the names of its columns.
inline std::string DigestLine(const ShippedSource& source, const std::vector<ShippedSource>& all) {
  Digests digests;
  AddShipped(source, all, digests);
  std::string line;
  for (const auto& [name, digest] : digests.Stages()) {
    char number[12];
    const uint64_t value = digest->value();
    std::snprintf(number, sizeof number, "%08x ", static_cast<unsigned>(value ^ value >> 32));
    line += number;
  }
  return line + source.path;
}
inline std::string DigestHead() {
  std::string line;
  for (const auto& [name, digest] : Digests().Stages()) line += (std::string(name) + "         ").substr(0, 9);
  return line + "file";
}

}  // namespace quillet::testing
