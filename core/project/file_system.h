// What the workspace asks of the file system, and paths as it spells them: absolute, with slashes alone, without `.`
// and `..`. Bytes as the operating system has them, UTF-8 on Windows.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "foundations/file_status.h"
#include "foundations/text.h"

namespace quillet {

// By which a change of a file is noticed, and of a folder that something came or went.
struct FileStamp {
  enum class Kind : uint8_t { kNone, kFile, kFolder, kOther, kUnsettled };
  Kind kind = Kind::kNone;
  uint64_t size = 0;     // of a file
  int64_t modified = 0;  // in nanoseconds
  uint64_t number = 0;   // of the file, which another one that takes its place has not

  bool is_file() const { return kind == Kind::kFile; }
  bool is_folder() const { return kind == Kind::kFolder; }
  friend bool operator==(const FileStamp&, const FileStamp&) = default;
};

// Links are followed.
FileStamp StampOf(const std::string& path);
// The stamp to remember of what is about to be read: where it was changed so lately that another change could leave
// the same stamp, one that equals none that StampOf gives.
FileStamp SettledStamp(FileStamp stamp);

using FolderEntry = ListedEntry;

// What lies in a folder, in no order; nothing for one that cannot be read.
std::vector<FolderEntry> EntriesOf(const std::string& folder);

// The content of a small regular file, such as one of settings; empty where it cannot be read.
std::string ReadSmallFile(const std::string& path);

// Where a path leads once all links are followed; the path itself where that cannot be told.
std::string RealPath(const std::string& path);

std::string NormalPath(Text path);
// Of a normal path: the folder it lies in (that of a top is itself), and its last part.
Text FolderOf(Text path);
Text LastPartOf(Text path);
std::string Join(Text folder, Text name);
// Whether a normal path is a folder or lies below it.
bool IsWithin(Text path, Text folder);

}  // namespace quillet
