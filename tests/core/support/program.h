// A program of a few files in a temporary folder, with places that its text marks: `$` in front of a name is a
// place and no part of the file.
#pragma once

#include <algorithm>
#include <initializer_list>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tests/core/support/small_library.h"
#include "tests/core/support/temporary_folder.h"
#include "workspace/questions.h"

namespace quillet::testing {

class Program {
 public:
  struct Place {
    FileId file;
    uint32_t offset;
  };

  // Files lie in `project`, those that begin with "library/" in the environment. Marks count in the order of the
  // files.
  Program(std::initializer_list<std::pair<std::string_view, std::string_view>> files,
          Version version = Version::Of(3, 12)) {
    Workspace::Settings settings;
    settings.roots = {folder_ / "project"};
    settings.libraries = {folder_ / "library"};
    settings.typeshed = SmallLibrary();
    settings.version = version;
    workspace_ = std::make_unique<Workspace>(std::move(settings));
    for (const auto& [path, text] : files) {
      const FileId file = File(path);
      folder_.Write(PathBelow(path), Unmarked(text, file));
    }
    workspace_->Refresh();
  }
  // One file, a.py.
  explicit Program(std::string_view text, Version version = Version::Of(3, 12)) : Program({{"a.py", text}}, version) {}

  Workspace& operator*() { return *workspace_; }
  Workspace* operator->() { return workspace_.get(); }
  const std::vector<Place>& places() const { return places_; }
  Place operator[](size_t i) const { return places_.at(i); }
  FileId File(std::string_view path) { return workspace_->FileOf(folder_ / PathBelow(path)); }

  // An editor's text for a file. Its marks come behind those that are there.
  void Open(std::string_view path, std::string_view text) {
    const FileId file = File(path);
    workspace_->Open(file, Unmarked(text, file));
  }

  std::string Types(size_t i) { return Joined(workspace_->Types(places_.at(i).file, places_.at(i).offset), " | "); }
  // Those of all marked places.
  std::vector<std::string> AllTypes() {
    std::vector<std::string> types;
    for (size_t i = 0; i < places_.size(); ++i) types.push_back(Types(i));
    return types;
  }

  // "a.py:2:5", with the certainty behind it where it is less than certain.
  std::string Say(const Location& location) { return Say(location.file, location.begin, location.certainty); }
  std::string Say(FileId file, uint32_t offset, Certainty certainty = Certainty::kCertain) {
    const std::string& path = workspace_->PathOf(file);
    const Position place = workspace_->PlaceOf(file, offset);
    const std::string project = folder_ / "project/";
    std::string said = path.starts_with(project)                ? path.substr(project.size())
                       : path.starts_with(folder_.path())       ? path.substr(folder_.path().size() + 1)
                       : path.starts_with(SmallLibrary() + "/") ? path.substr(SmallLibrary().size() + 1)
                                                                : path;
    said += ":" + std::to_string(place.line) + ":" + std::to_string(place.col);
    if (certainty != Certainty::kCertain) said += " " + std::string(WordOf(certainty));
    return said;
  }
  std::vector<std::string> Say(const std::vector<Location>& locations) {
    std::vector<std::string> said;
    for (const Location& location : locations) said.push_back(Say(location));
    return said;
  }
  std::vector<std::string> Definitions(size_t i = 0) {
    return Say(workspace_->Definitions(places_.at(i).file, places_.at(i).offset));
  }
  std::vector<std::string> References(size_t i = 0) {
    return Say(workspace_->References(places_.at(i).file, places_.at(i).offset));
  }

 private:
  static std::string PathBelow(std::string_view path) {
    return path.starts_with("library/") ? std::string(path) : "project/" + std::string(path);
  }
  std::string Unmarked(std::string_view text, FileId file) {
    std::string plain;
    for (const char c : text) {
      if (c == '$') {
        places_.push_back({file, static_cast<uint32_t>(plain.size())});
      } else {
        plain += c;
      }
    }
    return plain;
  }
  static std::string Joined(const std::vector<std::string>& parts, const char* between) {
    std::string text;
    for (const std::string& part : parts) text += (text.empty() ? "" : between) + part;
    return text;
  }

  TemporaryFolder folder_;
  std::unique_ptr<Workspace> workspace_;
  std::vector<Place> places_;
};

}  // namespace quillet::testing
