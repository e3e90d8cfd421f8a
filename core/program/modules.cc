// A tree of modules that grows by what is asked for. Each knows the folders of its submodules' sources and those of
// their stubs; the folders of the top are those of the settings.
#include "program/modules.h"

#include <algorithm>
#include <deque>
#include <unordered_map>
#include <utility>

#include "program/folders.h"
#include "program/typeshed.h"
#include "project/word_search.h"

namespace quillet {

namespace {

constexpr Text kPackageFile = "__init__.py";
constexpr Text kPackageStub = "__init__.pyi";
constexpr Text kStubSuffix = "-stubs";
// Folders of a project that hold nothing but stubs.
constexpr Text kStubFolders[] = {"typings", "stubs"};

// Modules that no file of a project takes the place of: they are there before any is looked for.
bool IsBuiltIn(Text name) { return name == "builtins" || name == "sys" || name == "_typeshed"; }

bool IsModuleName(Text name) {
  return !name.empty() && std::ranges::all_of(name, IsIdentifierByte) && !(name[0] >= '0' && name[0] <= '9');
}

}  // namespace

class Modules::Impl {
 public:
  Impl(Files& files, Settings settings)
      : files_(files), settings_(std::move(settings)), typeshed_(settings_.typeshed, files.version()), folders_(files) {
    for (std::string& root : settings_.roots) root = NormalPath(root);
    for (std::string& library : settings_.libraries) library = NormalPath(library);
    Begin();
  }

  const Module& operator[](ModuleId module) const { return entries_[module].module; }

  ModuleId Find(Text name) {
    ModuleId module = kTop;
    while (true) {
      const size_t dot = name.find('.');
      module = Child(module, name.substr(0, dot));
      if (module == kNoModule || dot == Text::npos) return module;
      name.remove_prefix(dot + 1);
    }
  }

  ModuleId FindFrom(FileId importer, int level, Text name) {
    std::string folder(FolderOf(files_.PathOf(importer)));
    if (level > 0) {
      for (; level > 1; --level) folder = FolderOf(folder);
      return Below(ModuleOfFolder(folder), name);
    }
    const Text first = name.substr(0, name.find('.'));
    if (ImportsFromOwnFolder(importer) && Child(ModuleOfFolder(folder), first) != kNoModule)
      return Below(ModuleOfFolder(folder), name);
    if (Child(kTop, first) != kNoModule) return Find(name);
    // A script finds what lies beside it, and a runner of tests what lies beside the packages that it is in.
    const std::string root = RootOf(folder);
    while (true) {
      const ModuleId package = ModuleOfFolder(folder);
      if (Child(package, first) != kNoModule) return Below(package, name);
      if (root.empty() || folder.size() <= root.size()) return kNoModule;
      folder = FolderOf(folder);
    }
  }

  ModuleId Child(ModuleId package, Text name) {
    if (package == kNoModule || name.empty() || name.find('/') != Text::npos) return kNoModule;
    if (const auto found = entries_[package].children.find(name); found != entries_[package].children.end())
      return found->second;
    const ModuleId child = package == kTop ? FindTop(name) : FindBelow(package, name);
    entries_[package].children.emplace(name, child);
    return child;
  }

  ModuleId OfFile(FileId file) {
    if (const auto found = module_of_file_.find(file); found != module_of_file_.end()) return found->second;
    const ModuleId module = LookForFile(file);
    module_of_file_.emplace(file, module);
    return module;
  }

  std::vector<std::string> ChildNames(ModuleId package) {
    std::vector<std::string> names;
    const bool is_top = package == kNoModule || package == kTop;
    const Entry& entry = entries_[is_top ? kTop : package];
    for (const auto* of : {&entry.sources, &entry.stubs}) {
      for (const std::string& folder : *of) AddNames(folder, names);
    }
    if (is_top) {
      for (std::string& name : typeshed_.TopNames()) names.push_back(std::move(name));
    }
    std::ranges::sort(names);
    names.erase(std::unique(names.begin(), names.end()), names.end());
    std::erase(names, "__init__");
    // What is compiled, of another version, or no package after all is not there.
    const ModuleId parent = is_top ? kTop : package;
    std::erase_if(names, [&](const std::string& name) { return Child(parent, name) == kNoModule; });
    return names;
  }

  bool Refresh() {
    if (!folders_.Refresh()) return false;
    Forget();
    return true;
  }

  void Forget() {
    folders_.Forget();
    Begin();
  }

 private:
  static constexpr ModuleId kTop = 0;

  struct TextHash {
    using is_transparent = void;
    size_t operator()(Text text) const { return std::hash<Text>()(text); }
  };
  struct Entry {
    Module module;
    std::vector<std::string> sources;  // folders of submodules
    std::vector<std::string> stubs;    // folders of submodules' stubs
    bool is_stray = false;             // no name of it leads here
    std::unordered_map<std::string, ModuleId, TextHash, std::equal_to<>> children;
  };

  // What is found of a module below some folders.
  struct Found {
    std::string file;
    std::string stub;
    std::vector<std::string> sources;
    std::vector<std::string> stubs;
    std::string in;  // the folder in which its source, or what is compiled of it, was found
    bool is_package = false;
    bool is_compiled = false;

    bool HasSource() const { return !file.empty() || is_compiled; }
  };

  void Begin() {
    entries_.clear();
    module_of_file_.clear();
    folder_modules_.clear();
    Entry& top = entries_.emplace_back();
    for (const auto* of : {&settings_.roots, &settings_.libraries}) {
      for (const std::string& folder : *of) {
        if (std::ranges::find(top.sources, folder) == top.sources.end()) top.sources.push_back(folder);
      }
    }
    for (const std::string& root : settings_.roots) {
      for (const Text name : kStubFolders) {
        if (folders_.HasFolder(root, name) && !folders_.HasFile(Join(root, name), kPackageFile))
          top.stubs.push_back(Join(root, name));
      }
    }
  }

  bool IsRoot(const std::string& folder) const {
    return std::ranges::find(settings_.roots, folder) != settings_.roots.end();
  }
  bool IsTop(const std::string& folder) const {
    return std::ranges::find(entries_[kTop].sources, folder) != entries_[kTop].sources.end();
  }
  // The innermost root that holds a folder; empty without one.
  std::string RootOf(Text folder) const {
    std::string innermost;
    for (const std::string& root : settings_.roots) {
      if (IsWithin(folder, root) && root.size() > innermost.size()) innermost = root;
    }
    return innermost;
  }
  bool IsStandardLibrary(const std::string& folder) {
    return LastPartOf(folder) == "lib-dynload" ||
           (folders_.HasFile(folder, "os.py") && folders_.HasFile(folder, "site.py"));
  }

  // ---- looking for a module ----

  // Its source, in the first folder that has it as a package or a module; folders that are no packages count
  // together where there is none.
  void LookForSource(const std::vector<std::string>& folders, Text name, Found& found) {
    std::vector<std::string> portions;
    const std::string source_name = std::string(name) + ".py";
    const std::string stub_name = source_name + "i";
    for (const std::string& folder : folders) {
      if (folders_.HasFolder(folder, name)) {
        std::string package = Join(folder, name);
        const bool has_source = folders_.HasFile(package, kPackageFile);
        const bool has_stub = folders_.HasFile(package, kPackageStub);
        if (has_stub && !has_source && found.file.empty()) {  // its source may lie in a folder behind
          AddStubFolder(std::move(package), found);
          if (found.in.empty()) found.in = folder;
          continue;
        }
        if (has_source) {
          found.file = Join(package, kPackageFile);
          if (has_stub && found.stub.empty()) found.stub = Join(package, kPackageStub);
          found.is_package = true;
          found.in = folder;
          found.sources.push_back(std::move(package));
          AddPortions(folders, name, found);
          return;
        }
        portions.push_back(std::move(package));
      }
      const bool has_source = folders_.HasFile(folder, source_name);
      const bool has_stub = folders_.HasFile(folder, stub_name);
      if (has_stub && !has_source) {
        if (found.stub.empty()) found.stub = Join(folder, stub_name);
        if (found.in.empty()) found.in = folder;
        continue;
      }
      if (has_source || folders_.HasCompiled(folder, name)) {
        if (has_source) found.file = Join(folder, source_name);
        if (has_stub && found.stub.empty()) found.stub = Join(folder, stub_name);
        found.is_compiled = !has_source && found.stub.empty();
        found.in = folder;
        return;
      }
    }
    if (portions.empty() || !found.stub.empty()) return;
    found.is_package = true;
    found.sources = std::move(portions);
  }

  // Packages of older days say in their source that they go on in the folders behind.
  void AddPortions(const std::vector<std::string>& folders, Text name, Found& found) {
    std::vector<std::string> portions;
    for (const std::string& folder : folders) {
      if (folder != found.in && folders_.HasFolder(folder, name)) portions.push_back(Join(folder, name));
    }
    if (portions.empty() || found.file.empty()) return;
    const std::string source = ReadSmallFile(found.file);
    if (!HoldsWord(source, "extend_path") && !HoldsWord(source, "declare_namespace")) return;
    for (std::string& portion : portions) found.sources.push_back(std::move(portion));
  }

  // Its stub in folders that hold stubs alone; the first one is taken, and any folder of more of them.
  void LookForStub(const std::vector<std::string>& folders, Text name, Found& found) {
    for (const std::string& folder : folders) {
      if (folders_.HasFolder(folder, name)) AddStubFolder(Join(folder, name), found);
      if (const std::string file = std::string(name) + ".pyi"; found.stub.empty() && folders_.HasFile(folder, file))
        found.stub = Join(folder, file);
    }
  }
  void AddStubFolder(std::string folder, Found& found) {
    if (found.stub.empty() && folders_.HasFile(folder, kPackageStub)) found.stub = Join(folder, kPackageStub);
    found.is_package = true;
    found.stubs.push_back(std::move(folder));
  }

  ModuleId FindTop(Text name) {
    const Entry& top = entries_[kTop];
    Found found;
    LookForStub(top.stubs, name, found);
    const std::string stubs_name = std::string(name).append(kStubSuffix);
    for (const std::string& folder : top.sources) {
      if (folders_.HasFolder(folder, stubs_name)) AddStubFolder(Join(folder, stubs_name), found);
    }
    const bool has_stub = !found.stub.empty();
    LookForSource(top.sources, name, found);
    if (!has_stub) AddTypeshed(name, found);
    return Add(kTop, name, std::move(found));
  }

  // The stub of the standard library, for what is found there, in a library (of which the project has a later one), or
  // nowhere.
  void AddTypeshed(Text name, Found& found) {
    if (typeshed_.folder().empty()) return;
    const Text new_name = typeshed_.NameOf(name);
    if (!typeshed_.Has(new_name)) return;
    if (IsBuiltIn(new_name)) {
      found = {};
    } else if (found.HasSource() || !found.stub.empty()) {
      if (IsRoot(found.in) && !IsStandardLibrary(found.in)) return;
      // The library of Python 2 says itself what it has.
      if (!found.file.empty() && !files_.version().AtLeast(3, 0)) return;
    } else {
      found = {};  // a folder that is no package gives way
    }
    const std::vector<std::string> folders = {typeshed_.folder()};
    if (new_name.find('.') == Text::npos) {
      Found stub;
      LookForStub(folders, new_name, stub);
      if (stub.stub.empty()) return;
      found.stub = std::move(stub.stub);
      found.stubs = std::move(stub.stubs);
      found.is_package |= stub.is_package;
    } else if (const ModuleId renamed = Find(new_name); renamed != kNoModule) {
      const Entry& entry = entries_[renamed];
      if (entry.module.stub != kNoFile) found.stub = files_.PathOf(entry.module.stub);
      found.stubs = entry.stubs;
      found.is_package |= entry.module.is_package;
    }
  }

  ModuleId FindBelow(ModuleId package, Text name) {
    const Entry& entry = entries_[package];
    if (!entry.module.is_package) return kNoModule;
    // What lies in a folder of the top is what its name leads to.
    if (entry.is_stray && entry.sources.size() == 1 && IsTop(entry.sources[0])) {
      const ModuleId found = Child(kTop, name);
      if (found != kNoModule && LiesIn(found, entry.sources[0])) return found;
    }
    Found found;
    const bool is_of_typeshed =
        !entry.stubs.empty() && !typeshed_.folder().empty() && IsWithin(entry.stubs[0], typeshed_.folder());
    if (!is_of_typeshed || typeshed_.Has(FullName(package, name))) LookForStub(entry.stubs, name, found);
    LookForSource(entry.sources, name, found);
    return Add(package, name, std::move(found));
  }

  bool LiesIn(ModuleId module, Text folder) const {
    const Module& found = entries_[module].module;
    const FileId file = found.file != kNoFile ? found.file : found.stub;
    if (file == kNoFile) return !found.folders.empty() && FolderOf(found.folders[0]) == folder;
    const Text in = FolderOf(files_.PathOf(file));
    return in == folder || (found.is_package && FolderOf(in) == folder);
  }

  std::string FullName(ModuleId package, Text name) const {
    std::string full = entries_[package].module.name;
    if (!full.empty()) full += '.';
    return full.append(name);
  }

  ModuleId Add(ModuleId package, Text name, Found found) {
    if (found.file.empty() && found.stub.empty() && !found.is_package) return kNoModule;
    Entry entry;
    entry.is_stray = entries_[package].is_stray;
    Module& module = entry.module;
    module.name = FullName(package, name);
    module.is_package = found.is_package;
    module.folders = found.sources;
    module.folders.insert(module.folders.end(), found.stubs.begin(), found.stubs.end());
    const std::string& place = !found.file.empty()      ? found.file
                               : !found.sources.empty() ? found.sources[0]
                               : !found.stub.empty()    ? found.stub
                                                        : found.stubs[0];
    module.is_project = IsOfProject(place);
    if (!found.file.empty()) module.file = files_.NumberOf(found.file);
    if (!found.stub.empty()) module.stub = files_.NumberOf(found.stub);
    entry.sources = std::move(found.sources);
    entry.stubs = std::move(found.stubs);
    return AddEntry(std::move(entry));
  }

  ModuleId AddEntry(Entry entry) {
    const auto number = static_cast<ModuleId>(entries_.size());
    entries_.push_back(std::move(entry));
    const Module& module = entries_.back().module;
    for (const FileId file : {module.file, module.stub}) {
      if (file != kNoFile) module_of_file_.emplace(file, number);
    }
    return number;
  }

  // Below a root, and no nearer to a library, which may lie in the project's folder.
  bool IsOfProject(Text path) const {
    const std::string root = RootOf(path);
    if (root.empty()) return false;
    for (const std::string& library : settings_.libraries) {
      if (IsWithin(path, library) && library.size() > root.size()) return false;
    }
    return true;
  }

  ModuleId Below(ModuleId module, Text name) {
    while (module != kNoModule && !name.empty()) {
      const size_t dot = name.find('.');
      module = Child(module, name.substr(0, dot));
      name.remove_prefix(dot == Text::npos ? name.size() : dot + 1);
    }
    return module;
  }

  // ---- from files and folders to modules ----

  // The dotted name of a path without its ending, by the innermost of the folders that it lies in; empty without one.
  std::string NameOfPath(Text path) const {
    Text innermost;
    const auto look_in = [&](const std::string& folder) {
      if (path.size() > folder.size() && IsWithin(path, folder) && folder.size() > innermost.size()) innermost = folder;
    };
    for (const auto* of : {&entries_[kTop].sources, &entries_[kTop].stubs}) {
      for (const std::string& folder : *of) look_in(folder);
    }
    if (!typeshed_.folder().empty()) look_in(typeshed_.folder());
    if (innermost.empty()) return {};
    std::string name(path.substr(innermost.ends_with('/') ? innermost.size() : innermost.size() + 1));
    const size_t first_size = std::min(name.find('/'), name.size());
    if (Text(name).substr(0, first_size).ends_with(kStubSuffix))
      name.erase(first_size - kStubSuffix.size(), kStubSuffix.size());
    std::ranges::replace(name, '/', '.');
    return name;
  }

  ModuleId LookForFile(FileId file) {
    const std::string& path = files_.PathOf(file);
    Text stem = LastPartOf(path);
    const bool is_stub = stem.ends_with(".pyi");
    if (stem.ends_with(".py") || is_stub) stem = stem.substr(0, stem.rfind('.'));
    const Text folder = FolderOf(path);
    const bool is_package = stem == "__init__";
    const std::string place = is_package ? std::string(folder) : Join(folder, stem);
    std::string name = NameOfPath(place);
    if (!name.empty()) {
      const ModuleId found = Find(name);
      if (found != kNoModule && (entries_[found].module.file == file || entries_[found].module.stub == file))
        return found;
    } else {
      name = LastPartOf(place);
    }
    if (is_package) {
      const ModuleId found = ModuleOfFolder(std::string(folder));
      if (entries_[found].module.file == file || entries_[found].module.stub == file) return found;
    }
    Entry entry;
    entry.is_stray = true;
    entry.module.name = std::move(name);
    (is_stub ? entry.module.stub : entry.module.file) = file;
    entry.module.is_package = is_package;
    entry.module.is_project = IsOfProject(path);
    return AddEntry(std::move(entry));
  }

  // What is imported from inside of a folder as `.`: the package that it is, or belongs to.
  ModuleId ModuleOfFolder(const std::string& folder) {
    if (const auto found = folder_modules_.find(folder); found != folder_modules_.end()) return found->second;
    std::string name = IsTop(folder) ? std::string() : NameOfPath(folder);
    ModuleId module = name.empty() ? kNoModule : Find(name);
    if (module == kNoModule || !HasFolder(module, folder)) {
      const bool has_source = folders_.HasFile(folder, kPackageFile);
      const bool has_stub = folders_.HasFile(folder, kPackageStub);
      if (name.empty() && (has_source || has_stub) && !IsTop(folder)) name = LastPartOf(folder);
      Entry entry;
      entry.is_stray = true;
      entry.module.name = std::move(name);
      entry.module.is_package = true;
      entry.module.is_project = IsOfProject(folder);
      entry.module.folders = entry.sources = {folder};
      if (has_source) entry.module.file = files_.NumberOf(Join(folder, kPackageFile));
      if (has_stub) entry.module.stub = files_.NumberOf(Join(folder, kPackageStub));
      module = AddEntry(std::move(entry));
    }
    folder_modules_.emplace(folder, module);
    return module;
  }

  bool HasFolder(ModuleId module, const std::string& folder) const {
    const std::vector<std::string>& folders = entries_[module].module.folders;
    return std::ranges::find(folders, folder) != folders.end();
  }

  // Whether `import a` looks beside the importing file first: in Python 2, unless the file says otherwise.
  bool ImportsFromOwnFolder(FileId importer) {
    if (files_.version().AtLeast(3, 0)) return false;
    const SourceFile* const file = files_.Get(importer);
    if (file == nullptr || !file->is_python2) return false;
    const FileSyntax& syntax = file->syntax;
    for (StmtId stmt = syntax.stmt(kModuleStmt).first_child; stmt != kModuleStmt; stmt = syntax.stmt(stmt).next) {
      const Stmt& statement = syntax.stmt(stmt);
      const auto exprs = syntax.ExprsOf(statement);
      if (statement.kind == StmtKind::kExpression && exprs.size() == 1 && syntax[exprs[0]].kind == ExprKind::kString)
        continue;
      if (statement.kind != StmtKind::kFromImport || exprs.empty()) return true;
      if (syntax.TextOf(syntax[exprs[0]]) != "__future__") return true;
      for (const ExprId alias : exprs.subspan(1)) {
        const ExprId name = syntax.ChildOf(alias, 0);
        if (name != kNoExpr && syntax.NameOf(name) == "absolute_import") return false;
      }
    }
    return true;
  }

  // ---- names ----

  void AddNames(const std::string& folder, std::vector<std::string>& names) {
    const Folders::Names found = folders_.NamesIn(folder);
    for (const Text name : found.modules) {
      if (IsModuleName(name)) names.emplace_back(name);
    }
    for (Text name : found.folders) {
      const bool has_stubs = name.ends_with(kStubSuffix);
      if (has_stubs) name.remove_suffix(kStubSuffix.size());
      if (!IsModuleName(name) || name == "__pycache__") continue;
      if (has_stubs || HoldsModules(Join(folder, name))) names.emplace_back(name);
    }
  }

  // A folder without any is hardly meant as a package.
  bool HoldsModules(const std::string& folder) {
    const Folders::Names found = folders_.NamesIn(folder);
    return !found.modules.empty() || std::ranges::any_of(found.folders, [&](Text name) {
      return IsModuleName(name) && folders_.HasFile(Join(folder, name), kPackageFile);
    });
  }

  Files& files_;
  Settings settings_;
  Typeshed typeshed_;
  Folders folders_;
  std::deque<Entry> entries_;
  std::unordered_map<FileId, ModuleId> module_of_file_;
  std::unordered_map<std::string, ModuleId> folder_modules_;
};

Modules::Modules(Files& files, Settings settings) : impl_(std::make_unique<Impl>(files, std::move(settings))) {}
Modules::~Modules() = default;

const Module& Modules::operator[](ModuleId module) const { return (*impl_)[module]; }
ModuleId Modules::Find(Text name) { return impl_->Find(name); }
ModuleId Modules::FindFrom(FileId importer, int level, Text name) { return impl_->FindFrom(importer, level, name); }
ModuleId Modules::Child(ModuleId package, Text name) { return impl_->Child(package, name); }
ModuleId Modules::OfFile(FileId file) { return impl_->OfFile(file); }
std::vector<std::string> Modules::ChildNames(ModuleId package) { return impl_->ChildNames(package); }
bool Modules::Refresh() { return impl_->Refresh(); }
void Modules::Forget() { impl_->Forget(); }

}  // namespace quillet
