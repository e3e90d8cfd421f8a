#include "workspace/questions.h"

#include <algorithm>
#if defined(__GLIBC__)
#include <malloc.h>
#endif

#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

Modules::Settings ModuleSettings(const Workspace::Settings& settings) {
  Modules::Settings made;
  for (const std::string& root : settings.roots)
    for (std::string& folder : SourceRootsOf(root)) made.roots.push_back(std::move(folder));
  made.libraries = settings.libraries;
  made.typeshed = settings.typeshed;
  return made;
}

}  // namespace

Text WordOf(Certainty certainty) {
  switch (certainty) {
    case Certainty::kCertain:
      return "certain";
    case Certainty::kLikely:
      return "likely";
    case Certainty::kByName:
      return "by name";
  }
  return {};
}

Workspace::Impl::Impl(Settings given)
    : settings(std::move(given)),
      files(settings.version),
      modules(files, ModuleSettings(settings)),
      project(files, settings.roots, settings.exclude, settings.index_maker),
      defined(files),
      inference(files, modules) {
  inference.set_callers(this);
  for (const std::string& folder : settings.libraries)
    if ((folder.ends_with("/site-packages") || folder.ends_with("/dist-packages")) && IsBelowRoot(folder))
      package_folders_.push_back(folder);
}

bool Workspace::Impl::IsBelowRoot(const std::string& path) const {
  return std::ranges::any_of(settings.roots, [&](const std::string& root) {
    return path.starts_with(root) && (path.size() == root.size() || root.ends_with('/') || path[root.size()] == '/');
  });
}

void Workspace::Impl::Forget() {
  modules.Forget();
  project.Forget();
  defined.Forget();
  inference.Clear();
  calls_by_name_.clear();
  common_.clear();
  ForgetPlaces();
}

void Workspace::Impl::Begin() {
  // What is asked in one breath is asked of the same files. Where many were read, a look at all of them takes long, and
  // breaths are as much longer.
  static constexpr std::chrono::steady_clock::duration kBreath = std::chrono::milliseconds(30);
  static constexpr int kBreathOfLooks = 100;
  const auto now = std::chrono::steady_clock::now();
  if (now - last_refresh_ > std::max(kBreath, last_look_ * kBreathOfLooks)) {
    defined.Forget();
    const bool has_changed = files.Refresh();
    const bool has_come_or_gone = project.Refresh();
    const bool leads_elsewhere = modules.Refresh();
    if (has_changed || has_come_or_gone || leads_elsewhere) Forget();
    last_refresh_ = std::chrono::steady_clock::now();
    last_look_ = last_refresh_ - now;
  }
  GiveBack();
  if (IsMuchRemembered()) ForgetFound();
  inference.Begin();
  texts_of_sets_.clear();
  ForgetPlaces();
  is_bounded = false;
}

void Workspace::Impl::BeginAnew() {
  Begin();
  inference.Clear();
  ForgetCalls();
}

void Workspace::Impl::ForgetFound() {
  inference.Clear();
  texts_of_sets_.clear();
  ForgetCalls();
#if defined(__GLIBC__)
  malloc_trim(0);  // small pieces between others that are in use, which the system does not get back otherwise
#endif
}

void Workspace::Impl::GiveBack() {
  if (files.ByteSize() > settings.most_held) files.Trim(settings.most_held / 4 * 3);
}

Workspace::Impl::Visit::Visit(Impl& at, FileId visited) : Visit(at, visited, at.files.IsHeld(visited)) {}

Workspace::Impl::Visit::Visit(Impl& at, FileId visited, bool was_held)
    : in_(at), id_(visited), was_held_(was_held), file(at.Get(visited)) {}

Workspace::Impl::Visit::~Visit() {
  if (!was_held_ && in_.files.ByteSize() > in_.settings.most_visited) in_.files.GiveBack(id_);
  in_.GiveBack();
}

Workspace::Impl::Visit Workspace::Impl::VisitAll::At(size_t i) {
  static constexpr size_t kFilesAhead = 16;
  if (i == read_) {
    const std::span<const FileId> next = files_.subspan(i, std::min(kFilesAhead, files_.size() - i));
    not_held_.clear();
    std::ranges::copy_if(next, std::back_inserter(not_held_), [&](FileId file) { return !in_.files.IsHeld(file); });
    in_.files.ReadAhead(not_held_);
    read_ += next.size();
  }
  return Visit(in_, files_[i], std::ranges::find(not_held_, files_[i]) == not_held_.end());
}

bool Workspace::Impl::IsProject(FileId file) {
  const std::string& path = files.PathOf(file);
  // An environment's folder of packages is none of the program's where it lies in a root.
  const auto is_in = [&](const std::string& folder) {
    return path.size() > folder.size() && path.starts_with(folder) && path[folder.size()] == '/';
  };
  return IsBelowRoot(path) && std::ranges::none_of(package_folders_, is_in);
}

// The calls of a function by its name, in the files that hold it: the first of them, so many.
std::vector<ExprPlace> Workspace::Impl::CallsOf(const FunctionInfo& function) {
  static constexpr size_t kMaxFiles = 8;
  static constexpr size_t kMaxCalls = 32;
  const SourceFile* own = Get(function.file);
  if (own == nullptr || own->is_stub) return {};
  Text name;
  if (function.lambda != kNoExpr) {  // by the name that it is given
    const Stmt& stmt = own->syntax.stmt(own->syntax.StatementOf(function.lambda));
    const auto exprs = own->syntax.ExprsOf(stmt);
    if (stmt.kind != StmtKind::kAssign || exprs.size() != 2 || exprs[1] != function.lambda) return {};
    name = own->syntax[exprs[0]].kind == ExprKind::kName ? own->syntax.TextOf(own->syntax[exprs[0]])
                                                         : own->syntax.NameOf(exprs[0]);
  } else {
    name = own->syntax.NameOf(own->syntax.stmt(function.stmt));
  }
  if (name.empty()) return {};
  if (name.starts_with("__") && name.ends_with("__")) {
    if ((name != "__init__" && name != "__new__") || function.cls == kNoId) return {};
    name = inference.MembersOf(function.cls).name;
  }
  // Its own file is looked through first, so functions of one name in other files have other calls.
  const std::pair<std::string, FileId> key(name, function.file);
  const auto [at, is_new] = calls_by_name_.try_emplace(key);
  if (!is_new) return at->second;
  std::vector<ExprPlace> calls;
  size_t count = 0;  // of files that have the name
  const auto look = [&](FileId id) {
    const SourceFile* file = inference.FileOf(id);
    const uint32_t number = file == nullptr ? kNoIndex : NumberOfText(file->bindings, name);
    if (number == kNoIndex) return;
    ++count;
    for (const Occurrence& occurrence : file->bindings.occurrences) {
      if (occurrence.text != number) continue;
      if (calls.size() >= kMaxCalls) break;
      const bool decorates = (occurrence.flags & kNameDecorator) != 0 && occurrence.role == NameRole::kRead;
      if (occurrence.role != NameRole::kCall && !decorates) continue;
      const ExprId named = file->syntax.NamedAt(occurrence.begin);
      if (decorates) {
        if (named != kNoExpr) calls.push_back({id, named});
        continue;
      }
      const ExprId call = named == kNoExpr ? kNoExpr : file->syntax[named].parent;
      if (call != kNoExpr && file->syntax[call].kind == ExprKind::kCall && file->syntax.ChildOf(call, 0) == named)
        calls.push_back({id, call});
    }
  };
  const auto is_enough = [&] { return calls.size() >= kMaxCalls || count >= kMaxFiles; };
  look(function.file);
  if (IsProject(function.file) && !is_enough()) {
    project.EachWithWord(name, [&](FileId id) {
      if (id != function.file) look(id);
      return !is_enough();
    });
  }
  calls_by_name_[key] = calls;
  return calls;
}

Workspace::Workspace(Settings settings) : impl_(std::make_unique<Impl>(std::move(settings))) {}
Workspace::~Workspace() = default;

FileId Workspace::FileOf(Text path) { return impl_->files.NumberOf(path); }
const std::string& Workspace::PathOf(FileId file) const { return impl_->files.PathOf(file); }

std::string Workspace::LineOf(FileId file, uint32_t offset) {
  const SourceFile* source = impl_->Get(file);
  if (source == nullptr) return {};
  const Text text = source->text();
  offset = std::min<uint32_t>(offset, static_cast<uint32_t>(text.size()));
  size_t begin = offset, end = offset;
  while (begin > 0 && text[begin - 1] != '\n' && text[begin - 1] != '\r') --begin;
  while (end < text.size() && text[end] != '\n' && text[end] != '\r') ++end;
  return std::string(text.substr(begin, end - begin));
}

Text Workspace::SourceOf(FileId file) {
  const SourceFile* source = impl_->Get(file);
  return source == nullptr ? Text("") : source->text();
}

bool Workspace::CanRead(FileId file) { return impl_->Get(file) != nullptr; }

void Workspace::Open(FileId file, std::string text) {
  impl_->files.Open(file, std::move(text));
  impl_->Forget();
}

void Workspace::Change(FileId file, uint32_t begin, uint32_t end, Text text) {
  impl_->files.Change(file, begin, end, text);
  impl_->ForgetCalls();
  impl_->inference.Clear();
  impl_->ForgetPlaces();
}

void Workspace::Close(FileId file) {
  impl_->files.Close(file);
  impl_->Forget();
}

void Workspace::Recover() { impl_->Forget(); }

void Workspace::Refresh() {
  impl_->files.Refresh();
  impl_->Forget();
}

bool Workspace::was_bounded() const { return impl_->is_bounded || impl_->inference.IsExhausted(); }
size_t Workspace::ByteSize() const { return impl_->files.ByteSize(); }

}  // namespace quillet
