// A walk over folders with the rules that hold in each of them.
#include "project/find_files.h"

#include <algorithm>
#include <cerrno>
#include <memory>
#include <optional>
#include <system_error>
#include <unordered_set>
#include <utility>

#include "foundations/file_status.h"
#include "foundations/stop.h"
#include "foundations/utf8.h"
#include "project/ignore_rules.h"

namespace quillet {

namespace {

// What is never anybody's source: left out below a folder, as if a rule behind all others said so.
constexpr Text kLeftOut = ".venv/\nnode_modules/\n__pycache__/\n";
constexpr Text kLeftOutOfPrograms = ".*/\nnode_modules/\n__pycache__/\n";
constexpr Text kMarkOfEnvironments = "pyvenv.cfg";
constexpr size_t kMostRules = size_t{1} << 24;
constexpr size_t kFirstLine = 256;
constexpr int64_t kStepsAnEntry = 100;

std::string ReasonOf(int error) { return std::generic_category().message(error); }

Text WithoutSlashes(Text folder) { return folder.substr(0, folder.find_last_not_of('/') + 1); }

std::string Joined(Text folder, Text name) {
  std::string path(folder);
  if (path.empty() || path.back() != '/') path += '/';
  return path.append(name);
}

bool IsBelow(Text path, Text folder) {
  if (path == folder) return true;
  folder = WithoutSlashes(folder);
  return path.size() > folder.size() && path.starts_with(folder) && path[folder.size()] == '/';
}

bool IsWord(char c) { return (AsciiClassOf(c) & (kAsciiAlpha | kAsciiDigit | kAsciiUnderscore)) != 0; }

// Whether the first line of a file names Python as its interpreter: the word, with a version or without.
bool NamesPython(const std::string& path) {
  constexpr Text kPython = "python";
  std::string bytes;
  if (ReadBeginning(path, true, kFirstLine, bytes)) return false;
  const Text line = Text(bytes).substr(0, bytes.find('\n'));
  if (!line.starts_with("#!")) return false;
  const auto is_word_at = [&](size_t i) { return i < line.size() && IsWord(line[i]); };
  for (size_t at = line.find(kPython, 2); at != Text::npos; at = line.find(kPython, at + 1)) {
    if (is_word_at(at - 1)) continue;
    for (size_t end = at + kPython.size();; ++end) {
      if (is_word_at(end - 1) != is_word_at(end)) return true;
      if (end >= line.size() || !(line[end] == '.' || (line[end] >= '0' && line[end] <= '9'))) break;
    }
  }
  return false;
}

// Where a path really leads, with slashes on every system.
std::string RealSlashed(const std::string& path) {
  std::string real = RealPathOf(path);
  if (real.empty()) real = path;
#ifdef _WIN32
  std::replace(real.begin(), real.end(), '\\', '/');
#endif
  return real;
}

// The rules of one folder, in front of those that they overrule.
class ChainedRules {
 public:
  ChainedRules(std::shared_ptr<ChainedRules> outer, Text folder, Text text)
      : outer_(std::move(outer)), start_(WithoutSlashes(folder).size() + 1), rules_(text) {}

  // What is said of a path, by the rules nearest to it that say anything.
  IgnoreRules::Verdict Of(Text path, bool is_folder) {
    for (ChainedRules* rules = this; rules != nullptr; rules = rules->outer_.get()) {
      const IgnoreRules::Verdict verdict =
          rules->rules_.Of(path.substr(std::min(rules->start_, path.size())), is_folder);
      if (verdict != IgnoreRules::Verdict::kNone) return verdict;
    }
    return IgnoreRules::Verdict::kNone;
  }

 private:
  std::shared_ptr<ChainedRules> outer_;
  size_t start_;
  IgnoreRules rules_;
};
using RuleChain = std::shared_ptr<ChainedRules>;

// The content of a small file, empty where there is none. As for git, a .gitignore is no link.
std::optional<int> ReadIfThere(const std::string& path, bool follow, std::string& text) {
  const std::optional<int> error = ReadBeginning(path, follow, kMostRules, text);
  if (!error) return std::nullopt;
  text.clear();
  switch (*error) {
    case ENOENT:
    case ENOTDIR:
    case ELOOP:
    case ENXIO:
    case EISDIR:
    case EINVAL:
      return std::nullopt;
    default:
      return error;
  }
}

Text Stripped(Text text) {
  constexpr Text kBlanks = " \t\r\n\v\f";
  text = text.substr(std::min(text.find_first_not_of(kBlanks), text.size()));
  return text.substr(0, text.find_last_not_of(kBlanks) + 1);
}

std::string PathIn(Text folder, Text path) { return path.starts_with('/') ? std::string(path) : Joined(folder, path); }

std::string ParentOf(const std::string& path) {
  const size_t slash = path.rfind('/');
  return slash == std::string::npos ? path : path.substr(0, std::max<size_t>(slash, 1));
}

// Reads files of rules, and says which in front of it.
class RuleReader {
 public:
  explicit RuleReader(const std::function<void(const std::string&)>& watch) : watch_(watch) {}

  // The rules of a file, in front of `outer`; only those where there are none.
  std::optional<int> ReadRules(const RuleChain& outer, Text folder, const std::string& path, bool follow,
                               RuleChain& rules) {
    std::string text;
    rules = outer;
    if (watch_) watch_(path);
    if (const std::optional<int> error = ReadIfThere(path, follow, text)) return error;
    if (!text.empty()) rules = std::make_shared<ChainedRules>(outer, folder, text);
    return std::nullopt;
  }

  // The rules of a repository that are in no folder of it.
  RuleChain ReadExclude(const RuleChain& outer, const std::string& root) {
    std::string folder = root + "/.git";
    const std::optional<FileStatus> status = StatusOf(folder);
    if (!status || !status->is_folder) {  // a worktree or a submodule: a file names the folder
      std::string text;
      if (ReadIfThere(folder, true, text)) return outer;
      Text named = text;
      if (named.starts_with("gitdir:")) named.remove_prefix(7);
      folder = PathIn(root, Stripped(named));
      if (ReadIfThere(folder + "/commondir", true, text)) return outer;
      folder = PathIn(folder, text.empty() ? Text(".") : Stripped(text));
    }
    RuleChain rules;
    return ReadRules(outer, root, folder + "/info/exclude", true, rules) ? outer : rules;
  }

  // The rules that hold in a folder from outside it: those of its repository, in front of `outer`. A folder that is
  // named is wanted: where they exclude it, they do not count.
  RuleChain RulesAbove(const RuleChain& outer, const std::string& folder) {
    std::vector<std::string> chain = {folder};
    while (!StatusOf(Joined(chain.back(), ".git"), false)) {
      std::string parent = ParentOf(chain.back());
      if (parent == chain.back()) return outer;  // in no repository: only the folder's own files count
      chain.push_back(std::move(parent));
    }
    RuleChain rules = ReadExclude(outer, chain.back());
    for (size_t i = chain.size() - 1; i-- > 0;) {
      const std::string& above = chain[i + 1];
      RuleChain read;
      // Who may not read a file of rules outside of what was named is no worse off than without it.
      if (!ReadRules(rules, above, Joined(above, ".gitignore"), false, read)) rules = read;
      if (rules->Of(chain[i], true) == IgnoreRules::Verdict::kExcluded) return outer;
    }
    return rules;
  }

 private:
  const std::function<void(const std::string&)>& watch_;
};

class FileWalk {
 public:
  FileWalk(const std::vector<std::string>& arguments, const WalkRules& rules)
      : arguments_(arguments), rules_(rules), reader_(rules.watch) {}

  std::vector<FoundFile> Files() {
    for (const std::string& argument : arguments_) roots_.push_back(argument != "-" ? RealSlashed(argument) : "");
    for (argument_ = 0; argument_ < arguments_.size(); ++argument_) {
      const std::string& argument = arguments_[argument_];
      if (argument == "-") {
        found_.push_back({argument, {}, argument_, 0, 0, 0});
        continue;
      }
      const std::optional<FileStatus> status = StatusOf(argument);
      if (status && status->is_folder) {
        WalkFolder(argument);
        continue;
      }
      found_.push_back({argument, std::string(DeviceProblem(argument)), argument_, 0, 0, 0});
    }
    AddLinks();
    return std::move(found_);
  }

 private:
  struct Folder {
    std::string path;
    std::string real;
    RuleChain rules;
    bool is_wanted;  // an argument, or taken in by a rule
  };

  // Behind all files, those that were not met by their own names.
  void AddLinks() {
    if (links_.empty()) return;
    std::unordered_set<std::string> met;
    for (const FoundFile& file : found_) {
      if (!file.problem.empty() || file.path == "-") continue;
      met.insert(file.below == 0 ? RealSlashed(file.path)
                                 : Joined(roots_[file.argument], file.path.substr(file.below)));
    }
    for (auto& [file, target] : links_) {
      if (met.insert(target).second) found_.push_back(std::move(file));
    }
  }

  void WalkFolder(const std::string& top) {
    // Names are shown as they were given; rules are asked with real paths, since those of the repository may stand
    // above the folder that was named.
    const std::string& real_top = roots_[argument_];
    below_ = static_cast<uint32_t>(Joined(top, "").size());
    base_ = std::make_shared<ChainedRules>(nullptr, real_top, rules_.is_program ? kLeftOutOfPrograms : kLeftOut);
    own_ = rules_.exclude.empty() ? nullptr : std::make_shared<ChainedRules>(nullptr, real_top, rules_.exclude);
    std::vector<Folder> pending;
    pending.push_back({top, real_top, rules_.gitignore ? reader_.RulesAbove(base_, real_top) : base_, true});
    while (!pending.empty()) {
      Folder folder = std::move(pending.back());
      pending.pop_back();
      if (rules_.watch) rules_.watch(folder.path);
      if (const std::optional<int> error = ListFolder(folder.path, entries_)) {
        AddProblem(folder.path, *error);
        continue;
      }
      std::sort(entries_.begin(), entries_.end(),
                [](const ListedEntry& a, const ListedEntry& b) { return a.name < b.name; });
      if (!folder.is_wanted && Holds(kMarkOfEnvironments)) continue;
      if (rules_.gitignore) AddRules(folder, folder.real == real_top);
      std::vector<Folder> folders;
      for (const ListedEntry& entry : entries_) {
        CountSteps(kStepsAnEntry);
        LookAt(folder, entry, folders);
      }
      std::move(folders.rbegin(), folders.rend(), std::back_inserter(pending));
    }
  }

  // Whether an entry of the folder has a name.
  bool Holds(Text name) const {
    const auto at = std::lower_bound(entries_.begin(), entries_.end(), name,
                                     [](const ListedEntry& entry, Text wanted) { return entry.name < wanted; });
    return at != entries_.end() && at->name == name;
  }

  bool HasSuffix(Text name) const {
    return name.ends_with(".py") || name.ends_with(".pyi") || (!rules_.is_program && name.ends_with(".pyw"));
  }
  // Whether a file may be Python whose name does not say so.
  bool MayNamePython(Text name) const { return !rules_.is_program && name.find('.') == Text::npos; }

  void AddRules(Folder& folder, bool is_top) {
    if (!is_top && Holds(".git")) folder.rules = reader_.ReadExclude(base_, folder.real);  // a repository within
    if (!Holds(".gitignore")) return;
    RuleChain rules;
    if (const std::optional<int> error =
            reader_.ReadRules(folder.rules, folder.real, Joined(folder.real, ".gitignore"), false, rules)) {
      AddProblem(Joined(folder.path, ".gitignore"), *error);
    } else {
      folder.rules = rules;
    }
  }

  void LookAt(const Folder& folder, const ListedEntry& entry, std::vector<Folder>& folders) {
    using Verdict = IgnoreRules::Verdict;
    const bool is_folder = entry.kind == ListedEntry::Kind::kFolder;
    if (entry.name == ".git") return;
    if (!is_folder && !HasSuffix(entry.name) && !MayNamePython(entry.name)) return;
    std::string real = Joined(folder.real, entry.name);
    Verdict verdict = own_ != nullptr ? own_->Of(real, is_folder) : Verdict::kNone;
    if (verdict == Verdict::kNone) verdict = folder.rules->Of(real, is_folder);
    if (verdict == Verdict::kExcluded) return;
    std::string path = Joined(folder.path, entry.name);
    if (is_folder) {
      folders.push_back({std::move(path), std::move(real), folder.rules, verdict == Verdict::kIncluded});
    } else if (entry.kind == ListedEntry::Kind::kFile) {
      AddFile(std::move(path), HasSuffix(entry.name));
    } else if (entry.kind == ListedEntry::Kind::kLink) {
      LookAtLink(std::move(path), HasSuffix(entry.name));
    }
  }

  void AddFile(std::string path, bool has_suffix) {
    if (rules_.is_program) {
      found_.push_back({std::move(path), {}, argument_, below_, 0, 0});
      return;
    }
    const std::optional<FileStatus> status = has_suffix || NamesPython(path) ? StatusOf(path) : std::nullopt;
    if (status) found_.push_back({std::move(path), {}, argument_, below_, status->size, status->time});
  }

  void LookAtLink(std::string path, bool has_suffix) {
    const std::optional<FileStatus> status = StatusOf(path);
    if (!status) {
      const int error = errno;
      // A link to nothing: a reader should hear of it where its name says that it is Python.
      if (has_suffix || (error != ENOENT && error != ENOTDIR)) AddProblem(path, error);
      return;
    }
    if (!status->is_file || !(has_suffix || NamesPython(path))) return;
    std::string target = RealSlashed(path);
    const auto holds = [&](const std::string& root) { return !root.empty() && IsBelow(target, root); };
    if (std::any_of(roots_.begin(), roots_.end(), holds))
      links_.push_back({{std::move(path), {}, argument_, below_, status->size, status->time}, std::move(target)});
  }

  void AddProblem(const std::string& path, int error) { found_.push_back({path, ReasonOf(error), argument_, 0, 0, 0}); }

  const std::vector<std::string>& arguments_;
  const WalkRules& rules_;
  RuleReader reader_;
  std::vector<std::string> roots_;  // where the arguments really are; empty for "-"
  std::vector<FoundFile> found_;
  std::vector<std::pair<FoundFile, std::string>> links_;  // and where they lead
  std::vector<ListedEntry> entries_;
  uint32_t argument_ = 0;
  uint32_t below_ = 0;
  RuleChain base_;
  RuleChain own_;
};

}  // namespace

std::vector<FoundFile> FindFiles(const std::vector<std::string>& arguments, const WalkRules& rules) {
  return FileWalk(arguments, rules).Files();
}

}  // namespace quillet
