// Files: the sources of a workspace by number, read when they are needed and again when they changed, and the
// buffers that an editor holds in their place.
#pragma once

#include <cstdint>
#include <exception>
#include <memory>
#include <span>
#include <string>
#include <unordered_map>
#include <vector>

#include "foundations/text.h"
#include "program/source_file.h"
#include "project/file_system.h"

namespace quillet {

// Decodes a source that names an encoding of its own to UTF-8; false where it cannot. Called by any thread.
using SourceDecoder = bool (*)(Text bytes, std::string& utf8);
// For all workspaces; without one such sources are read as Latin-1. To be called before other threads read.
void SetSourceDecoder(SourceDecoder decoder);

// A file that was given back has changed, and Refresh has not seen it yet: what was found in it holds no more.
class SourceChanged : public std::exception {
 public:
  const char* what() const noexcept override { return "a source changed while a question was answered"; }
};

class Files {
 public:
  // Sources above this many bytes are not read.
  static constexpr size_t kMaxSourceSize = size_t{64} << 20;

  explicit Files(Version version);
  ~Files();
  Files(const Files&) = delete;
  Files& operator=(const Files&) = delete;

  // The number of a path, which is made absolute and freed of `.` and `..`, not of links; nothing is read.
  FileId NumberOf(Text path);
  const std::string& PathOf(FileId file) const;
  // Whether a regular file is there, or a buffer. Remembered until Refresh.
  bool Exists(FileId file);

  // The file as it is; nullptr where it cannot be read. Stands until Refresh, Open, Change or Close says that
  // something changed. Bytes are decoded by encoding lines as batches decode them; what cannot be decoded is
  // read as Latin-1.
  const SourceFile* Get(FileId file);
  // Reads those that Get would have to read, by two threads. What cannot be read is left for Get to say.
  void ReadAhead(std::span<const FileId> files);
  // The same without syntax: whether a word stands in it as a whole word. False where it cannot be read.
  bool Holds(FileId file, Text word);
  // The source itself: a view of what is held of it, otherwise read into `memory`. Empty where it cannot be
  // read. Any number of threads may ask while nothing else is called.
  Text SourceOf(FileId file, std::string& memory) const;

  // What is held of a file, where it was read with such a stamp, or of its buffer. As SourceOf.
  const SourceFile* HeldAs(FileId file, const FileStamp& stamp) const;

  // The same of a file as it is on disk, whatever is held of it, by a stamp of it that was taken before: into `memory`,
  // which is empty where it cannot be read.
  void ReadSource(FileId file, const FileStamp& stamp, std::string& memory) const;

  // The line and the column of a place, from 1, in bytes: without an analysis. The place is held to no extent.
  Position PlaceOf(FileId file, uint32_t offset);

  // Looks whether files that were read have changed since (or ceased, or begun to exist); true where any did.
  bool Refresh();

  // An editor's text in place of the file's, which need not exist.
  void Open(FileId file, std::string text);
  // Replaces the bytes from `begin` to `end`, which are held to its extent. Opens the file where no buffer is open.
  void Change(FileId file, uint32_t begin, uint32_t end, Text text);
  void Close(FileId file);
  bool IsOpen(FileId file) const;
  bool IsStub(FileId file) const;
  // Those that a buffer holds, in no order.
  const std::vector<FileId>& Buffers() const;

  // Gives back what was read of files that no buffer holds while more than `bytes` are held, and first what was asked
  // for longest ago. Get reads them again, and throws SourceChanged where one is not the same by then.
  void Trim(size_t bytes);
  // Does so with one file.
  void GiveBack(FileId file);
  bool IsHeld(FileId file) const;
  size_t ByteSize() const;

  Version version() const { return version_; }
  // What a file is read as: stubs are written in the newest language, whatever the version that they describe.
  Version VersionOf(FileId file) const;

 private:
  class Impl;
  Version version_;
  std::unique_ptr<Impl> impl_;
};

}  // namespace quillet
