// Any bytes as a file that an editor has open, with all questions at some of its places, before and behind an edit.
//
// Whatever is answered lies within its file, and what is read of an edited buffer is what is read of the same text
// opened at once. The first two bytes choose the version, and where and what is edited.
#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>

#include "tests/core/support/small_library.h"
#include "tests/core/support/temporary_folder.h"
#include "workspace/questions.h"

namespace quillet {
namespace {

constexpr size_t kMaxInput = 2048;
constexpr size_t kMostPlaces = 24;
// What is remembered of the small library is made once for so many inputs.
constexpr int kRunsOfAWorkspace = 300;
constexpr Version kVersions[] = {Version::Of(2, 7), Version::Of(3, 6), Version::Of(3, 12), Version::Of(3, 14)};
constexpr std::string_view kInserted[] = {"(", ")", "\n", "a", ".", "\"\"\"", " ", "def f(x):\n  ", "import b\n", ""};

// That of the other file, which inputs may import.
constexpr const char* kOther =
    "class B:\n  x = 1\n  def f(self, y: int = 2) -> str: ...\n  @property\n  def p(self): return self.x\n"
    "def g(*args, **kwargs): return B()\n";

void Check(bool holds, const char* what) {
  if (holds) return;
  std::fprintf(stderr, "%s\n", what);
  std::abort();
}

class Asked {
 public:
  explicit Asked(Version version)
      : workspace_({.roots = {folder_.path()}, .typeshed = testing::SmallLibrary(), .version = version}) {
    folder_.Write("b.py", kOther);
    file_ = workspace_.FileOf(folder_ / "a.py");
  }

  void Open(std::string text) {
    size_ = text.size();
    workspace_.Open(file_, std::move(text));
  }
  void Change(uint32_t begin, uint32_t end, Text text) {
    workspace_.Change(file_, begin, end, text);
    size_ = workspace_.SourceOf(file_).size();
  }
  Text source() { return workspace_.SourceOf(file_); }

  // What is read of the file by itself.
  std::string Read() {
    std::string read;
    const auto add = [&](const auto&... numbers) { ((read += std::to_string(numbers) + " "), ...); };
    for (const OutlineItem& item : workspace_.Outline(file_)) {
      read += item.name + item.kind + item.detail;
      add(item.begin, item.end, item.name_begin, item.name_end, item.parent);
      CheckSpan(item.begin, item.end);
      CheckSpan(item.name_begin, item.name_end);
    }
    for (const Fold& fold : workspace_.Folds(file_)) add(fold.first_line, fold.last_line);
    uint32_t last = 0;
    for (const ColouredName& name : workspace_.Colours(file_)) {
      add(name.begin, name.end);
      CheckSpan(name.begin, name.end);
      Check(name.begin >= last, "coloured names are not in order");
      last = name.begin;
    }
    return read;
  }

  void AskEverywhere() {
    const std::vector<ColouredName> names = workspace_.Colours(file_);
    const size_t step = names.size() / kMostPlaces + 1;
    for (size_t i = 0; i < names.size(); i += step) AskAt(names[i].begin + (i % 2 != 0 ? 1 : 0));
    for (size_t at = 0; at <= size_; at += size_ / 8 + 1) AskAt(static_cast<uint32_t>(at));
    AskAt(UINT32_MAX);
    workspace_.Problems(file_);
    for (const InlineHint& hint : workspace_.Hints(file_)) CheckSpan(hint.offset, hint.offset);
    workspace_.Symbols("a");
  }

 private:
  void CheckSpan(uint32_t begin, uint32_t end) const {
    Check(begin <= end && end <= size_, "an answer lies outside of the file");
  }
  void CheckAll(const std::vector<Location>& locations) {
    for (const Location& location : locations) {
      if (location.file == file_) CheckSpan(location.begin, location.end);
      Check(location.file != kNoFile, "an answer lies in no file");
    }
  }

  void AskAt(uint32_t offset) {
    CheckAll(workspace_.Definitions(file_, offset));
    CheckAll(workspace_.TypeDefinitions(file_, offset));
    CheckAll(workspace_.Declarations(file_, offset));
    CheckAll(workspace_.Implementations(file_, offset));
    CheckAll(workspace_.References(file_, offset));
    CheckAll(workspace_.Supertypes(file_, offset));
    CheckAll(workspace_.Subtypes(file_, offset));
    workspace_.Types(file_, offset);
    workspace_.HoverAt(file_, offset);
    for (const Signature& signature : workspace_.Signatures(file_, offset))
      Check(signature.active < static_cast<int>(signature.parameters.size()), "no such parameter");
    workspace_.Complete(file_, offset);
    workspace_.DescribeCompletion(file_, offset, "f");
    workspace_.Callers(file_, offset);
    workspace_.Callees(file_, offset);
    uint32_t begin = offset, end = offset;
    for (const Span& span : workspace_.Selections(file_, offset)) {
      CheckSpan(span.begin, span.end);
      if (offset <= size_) Check(span.begin <= begin && span.end >= end, "a selection does not hold the one before");
      begin = std::min(begin, span.begin);
      end = std::max(end, span.end);
    }
    uint32_t last = 0;
    for (const TextEdit& edit : workspace_.RenameTo(file_, offset, "another_name", false).edits) {
      if (edit.file != file_) continue;
      CheckSpan(edit.begin, edit.end);
      Check(edit.begin >= last, "edits overlap");
      last = edit.end;
    }
    const Position place = workspace_.PlaceOf(file_, offset);
    const uint32_t held = std::min<uint32_t>(offset, static_cast<uint32_t>(size_));
    Check(workspace_.OffsetOf(file_, place.line, place.col) <= held, "a place lies behind itself");
  }

  testing::TemporaryFolder folder_;
  Workspace workspace_;
  FileId file_ = kNoFile;
  size_t size_ = 0;
};

}  // namespace
}  // namespace quillet

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace quillet;
  if (size < 2 || size > kMaxInput) return -1;
  static std::unique_ptr<Asked> asked[std::size(kVersions)];
  static int runs = 0;
  if (++runs % kRunsOfAWorkspace == 0)
    for (auto& workspace : asked) workspace.reset();
  const size_t version = data[0] % std::size(kVersions);
  if (asked[version] == nullptr) asked[version] = std::make_unique<Asked>(kVersions[version]);
  Asked& edited = *asked[version];

  std::string text(reinterpret_cast<const char*>(data + 2), size - 2);
  edited.Open(text);
  edited.Read();
  edited.AskEverywhere();

  const size_t begin = text.size() * data[1] / 256;
  const size_t end = std::min(begin + data[0] / 8 % 8, text.size());
  const std::string_view inserted = kInserted[data[1] % std::size(kInserted)];
  edited.Change(static_cast<uint32_t>(begin), static_cast<uint32_t>(end), inserted);
  text.replace(begin, end - begin, inserted);
  Check(edited.source() == text, "an edit gives another text");
  const std::string read = edited.Read();
  edited.AskEverywhere();
  edited.Open(text);
  Check(edited.Read() == read, "an edited buffer is read otherwise than the same text");
  return 0;
}
