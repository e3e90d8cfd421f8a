// The walk asks the rules of a folder, then those of the folders around it: the last rule that matches decides, and
// whatever lies in a folder that is left out is left out.
#include "workspace/project_files.h"

#include <algorithm>
#include <atomic>
#include <exception>
#include <optional>
#include <thread>
#include <unordered_set>
#include <utility>

#include "foundations/stop.h"
#include "workspace/file_system.h"
#include "workspace/ignore_rules.h"
#include "workspace/word_search.h"

namespace quillet {

namespace {

// Fewer files than this are searched before another thread has begun.
constexpr size_t kFilesWorthAThread = 64;

bool IsSourceName(Text name) { return name.ends_with(".py") || name.ends_with(".pyi"); }

// The rules of one folder, in front of those that they overrule.
struct FolderRules {
  std::shared_ptr<FolderRules> outer;
  std::string folder;
  IgnoreRules rules;

  // Whether a path below is left out.
  static bool Exclude(FolderRules* at, Text path, bool is_folder) {
    for (; at != nullptr; at = at->outer.get()) {
      const size_t start = at->folder.ends_with('/') ? at->folder.size() : at->folder.size() + 1;
      const IgnoreRules::Verdict verdict = at->rules.Of(path.substr(start), is_folder);
      if (verdict != IgnoreRules::Verdict::kNone) return verdict == IgnoreRules::Verdict::kExcluded;
    }
    return false;
  }
};
using Rules = std::shared_ptr<FolderRules>;

Rules WithRulesOf(Rules outer, const std::string& folder, const std::string& path) {
  const std::string text = ReadSmallFile(path);
  if (text.empty()) return outer;
  return std::make_shared<FolderRules>(std::move(outer), folder, IgnoreRules(text));
}

Text WithoutLineEnd(Text text) {
  while (text.ends_with('\n') || text.ends_with('\r') || text.ends_with(' ')) text.remove_suffix(1);
  return text;
}

std::string PathFrom(const std::string& folder, Text path) {
  return NormalPath(path.starts_with('/') ? std::string(path) : Join(folder, path));
}

// The rules of a repository that are in no folder of it.
Rules RepositoryRules(const std::string& root) {
  std::string git = Join(root, ".git");
  if (!StampOf(git).is_folder()) {  // a worktree or a submodule: a file names the folder
    const std::string text = ReadSmallFile(git);
    Text path = WithoutLineEnd(text);
    if (!path.starts_with("gitdir:")) return nullptr;
    path.remove_prefix(7);
    path.remove_prefix(std::min(path.find_first_not_of(' '), path.size()));
    git = PathFrom(root, path);
    if (const std::string common = ReadSmallFile(Join(git, "commondir")); !common.empty())
      git = PathFrom(git, WithoutLineEnd(common));
  }
  return WithRulesOf(nullptr, root, Join(git, "info/exclude"));
}

// The rules that hold in a folder from outside it. A folder that is named is wanted: where they exclude it, they do
// not count.
Rules RulesAbove(const std::string& folder) {
  std::vector<std::string> chain = {folder};
  while (!IsThere(Join(chain.back(), ".git"))) {
    std::string parent(FolderOf(chain.back()));
    if (parent == chain.back()) return nullptr;
    chain.push_back(std::move(parent));
  }
  Rules rules = RepositoryRules(chain.back());
  for (size_t i = chain.size() - 1; i > 0; --i) {
    rules = WithRulesOf(std::move(rules), chain[i], Join(chain[i], ".gitignore"));
    if (FolderRules::Exclude(rules.get(), chain[i - 1], true)) return nullptr;
  }
  return rules;
}

class ProjectWalk {
 public:
  explicit ProjectWalk(const std::vector<std::string>& roots) : roots_(roots) {
    for (const std::string& root : roots) real_roots_.push_back(RealPath(root));
  }

  std::vector<std::string> Paths() {
    for (size_t i = 0; i < roots_.size(); ++i) {
      if (StampOf(roots_[i]).is_file()) {
        AddFile(roots_[i], real_roots_[i]);
      } else if (!folders_.contains(real_roots_[i])) {
        Walk(roots_[i], real_roots_[i], RulesAbove(real_roots_[i]));
      }
    }
    for (auto& [path, target] : links_) {
      if (met_.insert(std::move(target)).second) paths_.push_back(std::move(path));
    }
    return std::move(paths_);
  }

 private:
  struct Pending {
    std::string folder;
    std::string real_folder;
    Rules rules;
  };

  void Walk(const std::string& top, const std::string& real_top, Rules rules) {
    std::vector<Pending> pending;
    pending.push_back({top, real_top, std::move(rules)});
    while (!pending.empty()) {
      Pending next = std::move(pending.back());
      pending.pop_back();
      if (!folders_.insert(next.real_folder).second) continue;
      CountSteps(kStepsOfFolder);
      WalkFolder(std::move(next), next.real_folder == real_top, pending);
    }
  }

  void WalkFolder(Pending at, bool is_top, std::vector<Pending>& pending) {
    const std::vector<FolderEntry> entries = EntriesOf(at.folder);
    bool has_rules = false;
    bool is_repository = false;
    for (const FolderEntry& entry : entries) {
      has_rules |= entry.name == ".gitignore" && entry.kind == FolderEntry::Kind::kFile;
      is_repository |= entry.name == ".git";
      if (entry.name == "pyvenv.cfg" && !is_top) return;
    }
    if (is_repository && !is_top) at.rules = RepositoryRules(at.real_folder);  // one within, with rules of its own
    if (has_rules) at.rules = WithRulesOf(at.rules, at.real_folder, Join(at.real_folder, ".gitignore"));
    for (const FolderEntry& entry : entries) {
      const bool is_folder = entry.kind == FolderEntry::Kind::kFolder;
      if (!is_folder && (entry.kind == FolderEntry::Kind::kOther || !IsSourceName(entry.name))) continue;
      if (is_folder && IsLeftOut(entry.name)) continue;
      std::string real_path = Join(at.real_folder, entry.name);
      if (at.rules != nullptr && FolderRules::Exclude(at.rules.get(), real_path, is_folder)) continue;
      std::string path = Join(at.folder, entry.name);
      if (is_folder) {
        pending.push_back({std::move(path), std::move(real_path), at.rules});
      } else if (entry.kind == FolderEntry::Kind::kFile) {
        AddFile(std::move(path), std::move(real_path));
      } else if (StampOf(path).is_file()) {
        std::string target = RealPath(path);
        if (std::ranges::any_of(real_roots_, [&](const std::string& root) { return IsWithin(target, root); }))
          links_.emplace_back(std::move(path), std::move(target));
      }
    }
  }

  static bool IsLeftOut(Text folder) {
    return folder.starts_with('.') || folder == "__pycache__" || folder == "node_modules";
  }

  void AddFile(std::string path, std::string real_path) {
    if (met_.insert(std::move(real_path)).second) paths_.push_back(std::move(path));
  }

  static constexpr int64_t kStepsOfFolder = 100;

  const std::vector<std::string>& roots_;
  std::vector<std::string> real_roots_;
  std::vector<std::string> paths_;
  std::unordered_set<std::string> met_;      // files, by real paths
  std::unordered_set<std::string> folders_;  // likewise
  std::vector<std::pair<std::string, std::string>> links_;
};

// Calls `fn(i, memory)` for each number below `count`, by this thread and another one. What one of them throws ends
// it, and is thrown.
template <class Function>
void ForEachByThreads(size_t count, Function&& fn) {
  std::atomic<size_t> next{0};
  const auto work = [&] {
    std::string memory;
    try {
      for (size_t i = next++; i < count; i = next++) fn(i, memory);
    } catch (...) {
      next = count;
      throw;
    }
  };
  std::exception_ptr failure;
  std::optional<std::thread> helper;
  if (count >= kFilesWorthAThread) {
    try {
      helper.emplace([&] {
        try {
          work();
        } catch (...) {
          failure = std::current_exception();
        }
      });
    } catch (const std::exception&) {  // one thread does the same work
    }
  }
  try {
    work();
  } catch (...) {
    if (helper) helper->join();
    throw;
  }
  if (helper) helper->join();
  if (failure) std::rethrow_exception(failure);
}

}  // namespace

class ProjectFiles::Impl {
 public:
  Impl(Files& files, std::vector<std::string> roots) : files_(files), roots_(std::move(roots)) {
    for (std::string& root : roots_) root = NormalPath(root);
  }

  const std::vector<FileId>& All() {
    if (!has_walked_) Walk();
    return all_;
  }

  std::vector<FileId> WithWords(std::vector<Text> words) {
    const std::vector<FileId>& all = All();
    // The longest is most likely the one that is not there.
    std::ranges::stable_sort(words, std::greater(), &Text::size);
    std::vector<char> holds(all.size());
    ForEachByThreads(all.size(), [&](size_t i, std::string& memory) {
      const Text source = files_.SourceOf(all[i], memory);
      CountSteps(static_cast<int64_t>(source.size() / kBytesOfAStep));
      holds[i] = std::ranges::all_of(words, [&](Text word) { return HoldsWord(source, word); });
    });
    std::vector<FileId> found;
    for (size_t i = 0; i < all.size(); ++i) {
      if (holds[i] != 0) found.push_back(all[i]);
    }
    return found;
  }

  void Forget() { has_walked_ = false; }

 private:
  static constexpr size_t kBytesOfAStep = 64;

  void Walk() {
    std::vector<std::string> paths = ProjectWalk(roots_).Paths();
    for (const FileId buffer : files_.Buffers()) {
      const std::string& path = files_.PathOf(buffer);
      if (std::ranges::any_of(roots_, [&](const std::string& root) { return IsWithin(path, root); }))
        paths.push_back(path);
    }
    std::ranges::sort(paths);
    paths.erase(std::unique(paths.begin(), paths.end()), paths.end());
    all_.clear();
    all_.reserve(paths.size());
    for (const std::string& path : paths) all_.push_back(files_.NumberOf(path));
    has_walked_ = true;
  }

  Files& files_;
  std::vector<std::string> roots_;
  std::vector<FileId> all_;
  bool has_walked_ = false;
};

ProjectFiles::ProjectFiles(Files& files, std::vector<std::string> roots)
    : impl_(std::make_unique<Impl>(files, std::move(roots))) {}
ProjectFiles::~ProjectFiles() = default;

const std::vector<FileId>& ProjectFiles::All() { return impl_->All(); }
std::vector<FileId> ProjectFiles::WithWords(const std::vector<Text>& words) { return impl_->WithWords(words); }
void ProjectFiles::Forget() { impl_->Forget(); }

}  // namespace quillet
