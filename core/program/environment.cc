// Where an interpreter would look, from the folders that are there: its own library, its site-packages, and what files
// of the endings .pth add to those.
#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <optional>
#include <utility>

#include "program/modules.h"
#include "project/file_system.h"

namespace quillet {

namespace {

bool IsFolder(const std::string& path) { return StampOf(path).is_folder(); }

Text WithoutBlanks(Text text) {
  const size_t begin = text.find_first_not_of(" \t\r\n\f\v");
  if (begin == Text::npos) return {};
  return text.substr(begin, text.find_last_not_of(" \t\r\n\f\v") - begin + 1);
}

// Calls `fn(line)` for each line, without blanks around it.
template <class Function>
void ForEachLine(Text text, Function&& fn) {
  while (!text.empty()) {
    const size_t end = std::min(text.find('\n'), text.size());
    fn(WithoutBlanks(text.substr(0, end)));
    text.remove_prefix(std::min(end + 1, text.size()));
  }
}

// The version that a text begins with, of at least two parts: "3.11", "3.11.7", "2.7t". Count 0 for any other.
Version VersionOfText(Text text) {
  Version version{{0, 0, 0}, 0};
  const char* at = text.data();
  const char* const end = at + text.size();
  while (version.count < 3) {
    const auto [behind, error] = std::from_chars(at, end, version.parts[version.count]);
    if (error != std::errc()) break;
    ++version.count;
    if (behind == end || *behind != '.') break;
    at = behind + 1;
  }
  if (version.count < 2) version = {{0, 0, 0}, 0};
  return version;
}

// Without the last part: that of a folder's name.
std::pair<int, int> MinorOf(const Version& version) { return {version.parts[0], version.parts[1]}; }

// What pyvenv.cfg says.
struct VenvSettings {
  std::string home;
  bool has_system_packages = false;
  Version version{{0, 0, 0}, 0};
};

std::optional<VenvSettings> ReadVenvSettings(const std::string& folder) {
  const std::string path = Join(folder, "pyvenv.cfg");
  if (!StampOf(path).is_file()) return std::nullopt;
  VenvSettings settings;
  ForEachLine(ReadSmallFile(path), [&](Text line) {
    const size_t equal = line.find('=');
    if (equal == Text::npos) return;
    std::string key(WithoutBlanks(line.substr(0, equal)));
    std::ranges::transform(key, key.begin(),
                           [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c; });
    const Text value = WithoutBlanks(line.substr(equal + 1));
    if (key == "home") {
      settings.home = NormalPath(value);
    } else if (key == "include-system-site-packages") {
      settings.has_system_packages = value == "true" || value == "True" || value == "TRUE";
    } else if ((key == "version" || key == "version_info") && settings.version.count == 0) {
      settings.version = VersionOfText(value);
    }
  });
  return settings;
}

// The names of folders such as python3.11 (and pypy3.10) in a folder, the newest first.
std::vector<std::pair<std::string, Version>> VersionFolders(const std::string& folder) {
  std::vector<std::pair<std::string, Version>> found;
  for (const FolderEntry& entry : EntriesOf(folder)) {
    Text digits = entry.name;
    if (digits.starts_with("python")) {
      digits.remove_prefix(6);
    } else if (digits.starts_with("pypy")) {
      digits.remove_prefix(4);
    } else {
      continue;
    }
    const Version version = VersionOfText(digits);
    if (version.count == 0 || entry.kind == FolderEntry::Kind::kFile) continue;
    if (std::string path = Join(folder, entry.name); IsFolder(path)) found.emplace_back(std::move(path), version);
  }
  std::ranges::sort(found, [](const auto& a, const auto& b) {
    return MinorOf(a.second) != MinorOf(b.second) ? MinorOf(a.second) > MinorOf(b.second) : a.first < b.first;
  });
  return found;
}

class LibraryFinder {
 public:
  // Of the installation below `prefix`, which is a virtual one where it has settings.
  Environment Find(const std::string& prefix, Version version) {
    found_.version = version;
    if (const std::optional<VenvSettings> settings = ReadVenvSettings(prefix)) {
      if (settings->version.count != 0) found_.version = settings->version;
      if (found_.version.count == 0) TakeVersion(prefix);
      const std::string base = BaseOfHome(settings->home);
      if (!base.empty()) AddStandardLibrary(base);
      AddSitePackages(prefix);
      if (settings->has_system_packages && !base.empty()) AddSystemPackages(base);
    } else {
      if (found_.version.count == 0) TakeVersion(prefix);
      AddStandardLibrary(prefix);
      AddSystemPackages(prefix);
    }
    return std::move(found_);
  }

  Environment OfSiteFolder(const std::string& folder) {
    AddSiteFolder(folder);
    if (const Text above = LastPartOf(FolderOf(folder)); above.starts_with("python"))
      found_.version = VersionOfText(above.substr(6));
    return std::move(found_);
  }

 private:
  void TakeVersion(const std::string& prefix) {
    for (const char* lib : {"lib", "lib64"}) {
      for (const auto& [folder, version] : VersionFolders(Join(prefix, lib))) {
        // What only a system's packages made may hold no interpreter's library.
        if (found_.version.count == 0 || StampOf(Join(folder, "os.py")).is_file()) found_.version = version;
        if (StampOf(Join(folder, "os.py")).is_file()) return;
      }
    }
  }

  bool IsOfVersion(const Version& version) const {
    return found_.version.count == 0 || MinorOf(version) == MinorOf(found_.version);
  }

  // The installation whose interpreters lie in a folder; they may be links into another one.
  std::string BaseOfHome(const std::string& home) const {
    if (home.empty()) return {};
    const std::string prefix(FolderOf(home));
    if (HasStandardLibrary(prefix)) return prefix;
    if (HasStandardLibrary(home)) return home;  // on Windows it lies beside the interpreter
    std::vector<std::string> names = {"python3", "python", "python2"};
    if (found_.version.count >= 2) {
      names.insert(names.begin(),
                   "python" + std::to_string(found_.version.parts[0]) + "." + std::to_string(found_.version.parts[1]));
    }
    for (const std::string& name : names) {
      const std::string link = Join(home, name);
      if (!StampOf(link).is_file()) continue;
      const std::string real = RealPath(link);
      if (std::string base(FolderOf(FolderOf(real))); HasStandardLibrary(base)) return base;
    }
    return {};
  }

  bool HasStandardLibrary(const std::string& prefix) const {
    if (StampOf(Join(prefix, "Lib/os.py")).is_file()) return true;
    for (const char* lib : {"lib", "lib64"}) {
      for (const auto& [folder, version] : VersionFolders(Join(prefix, lib))) {
        if (IsOfVersion(version) && StampOf(Join(folder, "os.py")).is_file()) return true;
      }
    }
    return false;
  }

  void AddStandardLibrary(const std::string& prefix) {
    for (const char* lib : {"lib", "lib64"}) {
      for (const auto& [folder, version] : VersionFolders(Join(prefix, lib))) {
        if (!IsOfVersion(version) || !StampOf(Join(folder, "os.py")).is_file()) continue;
        AddFolder(folder);
        // Of Python 2, what the system's and the toolkit's modules are.
        for (const FolderEntry& entry : EntriesOf(folder)) {
          if (entry.name.starts_with("plat-") || entry.name == "lib-tk") AddFolder(Join(folder, entry.name));
        }
        AddFolder(Join(folder, "lib-dynload"));
        return;
      }
    }
    if (const std::string windows = Join(prefix, "Lib"); StampOf(Join(windows, "os.py")).is_file()) {
      AddFolder(windows);
      AddFolder(Join(prefix, "DLLs"));
    }
  }

  void AddSitePackages(const std::string& prefix) {
    for (const char* lib : {"lib", "lib64"}) {
      for (const auto& [folder, version] : VersionFolders(Join(prefix, lib))) {
        if (IsOfVersion(version)) AddSiteFolder(Join(folder, "site-packages"));
      }
    }
    AddSiteFolder(Join(prefix, "Lib/site-packages"));
    AddSiteFolder(Join(prefix, "site-packages"));  // of PyPy
  }

  // Those of a whole installation: the user's, its own, and where systems put what they install themselves.
  void AddSystemPackages(const std::string& prefix) {
    const std::string minor = found_.version.count >= 2 ? std::to_string(found_.version.parts[0]) + "." +
                                                              std::to_string(found_.version.parts[1])
                                                        : std::string();
    const bool is_of_system = prefix == "/usr" || prefix == "/usr/local";
    if (const char* user = std::getenv("HOME"); user != nullptr && *user != '\0' && !minor.empty())
      AddSiteFolder(Join(user, ".local/lib/python" + minor + "/site-packages"));
    if (is_of_system && !minor.empty()) {
      AddSiteFolder("/usr/local/lib/python" + minor + "/dist-packages");
      AddSiteFolder("/usr/local/lib/python" + minor + "/site-packages");
    }
    AddSitePackages(prefix);
    if (is_of_system && found_.version.count != 0) {
      if (found_.version.parts[0] == 3) AddSiteFolder("/usr/lib/python3/dist-packages");
      AddSiteFolder("/usr/lib/python" + minor + "/dist-packages");
    }
  }

  // Once, by whatever links it is reached.
  bool AddFolder(const std::string& folder) {
    if (!IsFolder(folder)) return false;
    std::string real = RealPath(folder);
    if (std::ranges::find(real_folders_, real) != real_folders_.end()) return false;
    real_folders_.push_back(std::move(real));
    found_.libraries.push_back(folder);
    return true;
  }

  // A folder of packages and what its *.pth files add.
  void AddSiteFolder(const std::string& given) {
    const std::string folder = NormalPath(given);
    if (!AddFolder(folder)) return;
    std::vector<std::string> names;
    for (FolderEntry& entry : EntriesOf(folder)) {
      if (entry.name.ends_with(".pth") && !entry.name.starts_with('.')) names.push_back(std::move(entry.name));
    }
    std::ranges::sort(names);
    for (const std::string& name : names) {
      std::string text = ReadSmallFile(Join(folder, name));
      if (text.starts_with("\xEF\xBB\xBF")) text.erase(0, 3);
      ForEachLine(text, [&](Text line) {
        if (line.empty() || line.starts_with('#')) return;
        if (line.starts_with("import ") || line.starts_with("import\t"))
          AddOfFinder(folder, line);
        else
          AddFolder(NormalPath(IsAbsolute(line) ? std::string(line) : Join(folder, line)));
      });
    }
  }

  static bool IsAbsolute(Text path) {
    return path.starts_with('/') || path.starts_with('\\') || (path.size() > 1 && path[1] == ':');
  }

  // A package that is installed for editing may be found by a module of its own, `__editable___name_finder`, in which a
  // dictionary says where each package lies: there, its parent is taken in.
  void AddOfFinder(const std::string& folder, Text line) {
    const size_t begin = line.find("__editable__");
    if (begin == Text::npos) return;
    const Text module = line.substr(begin, line.find_first_of(" ;.,(", begin) - begin);
    const std::string source = ReadSmallFile(Join(folder, std::string(module) + ".py"));
    size_t at = source.find("\nMAPPING");
    if (at == std::string::npos) return;
    at = source.find('{', at);
    const size_t end = source.find('}', at == std::string::npos ? 0 : at);
    if (at == std::string::npos || end == std::string::npos) return;
    const std::vector<std::string> strings = StringsOf(Text(source).substr(at, end - at));
    for (size_t i = 0; i + 1 < strings.size(); i += 2) {
      const std::string path = NormalPath(strings[i + 1]);
      const Text key = Text(strings[i]).substr(Text(strings[i]).rfind('.') + 1);
      Text name = LastPartOf(path);
      if (name.ends_with(".py")) name.remove_suffix(3);
      if (name == key && strings[i].find('.') == std::string::npos) AddFolder(std::string(FolderOf(path)));
    }
  }

  // The texts of string literals without prefixes.
  static std::vector<std::string> StringsOf(Text text) {
    std::vector<std::string> strings;
    for (size_t at = 0; at < text.size(); ++at) {
      const char quote = text[at];
      if (quote != '\'' && quote != '"') continue;
      std::string& value = strings.emplace_back();
      for (++at; at < text.size() && text[at] != quote; ++at) {
        if (text[at] == '\\' && at + 1 < text.size()) ++at;
        value += text[at];
      }
    }
    return strings;
  }

  Environment found_{{}, {{0, 0, 0}, 0}};
  std::vector<std::string> real_folders_;
};

// The version in the name of an interpreter, such as python3.11.
Version VersionOfInterpreter(Text name) {
  if (name.ends_with(".exe")) name.remove_suffix(4);
  if (name.starts_with("python")) return VersionOfText(name.substr(6));
  if (name.starts_with("pypy")) return VersionOfText(name.substr(4));
  return {{0, 0, 0}, 0};
}

}  // namespace

Environment FindEnvironment(const std::string& given) {
  const std::string path = NormalPath(given);
  LibraryFinder finder;
  if (StampOf(path).is_folder()) {
    const Text name = LastPartOf(path);
    if (name == "site-packages" || name == "dist-packages") return finder.OfSiteFolder(path);
    const bool holds_interpreter = name == "bin" || name == "Scripts";
    return finder.Find(holds_interpreter ? std::string(FolderOf(path)) : path, {{0, 0, 0}, 0});
  }
  // An interpreter: that of a virtual environment is a link, which must not be followed.
  const Version version = VersionOfInterpreter(LastPartOf(path));
  const std::string folder(FolderOf(path));
  const std::string above(FolderOf(folder));
  for (const std::string& prefix : {folder, above}) {
    if (StampOf(Join(prefix, "pyvenv.cfg")).is_file()) return finder.Find(prefix, version);
  }
  const std::string real = RealPath(path);
  const std::string real_folder(FolderOf(real));
  const Version real_version = VersionOfInterpreter(LastPartOf(real));
  const bool is_beside_library = StampOf(Join(real_folder, "Lib/os.py")).is_file();
  return finder.Find(is_beside_library ? real_folder : std::string(FolderOf(real_folder)),
                     real_version.count != 0 ? real_version : version);
}

std::vector<std::string> SourceRootsOf(const std::string& given) {
  std::string folder = NormalPath(given);
  const auto is_package = [](const std::string& path) {
    return StampOf(Join(path, "__init__.py")).is_file() || StampOf(Join(path, "__init__.pyi")).is_file();
  };
  // What lies in a package is imported from where the outermost one lies.
  while (is_package(folder) && FolderOf(folder) != folder) folder = FolderOf(folder);
  std::vector<std::string> roots = {folder};
  if (const std::string src = Join(folder, "src"); IsFolder(src) && !is_package(src)) roots.push_back(src);
  return roots;
}

}  // namespace quillet
