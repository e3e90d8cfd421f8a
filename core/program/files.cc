// A binder and a reader for each version and thread serve all files; what they give is copied, so that a file holds no
// more memory than it needs. Tokens go back when a file was read.
#include "program/files.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <deque>
#include <optional>
#include <utility>

#include "analysis/source_bytes.h"
#include "foundations/utf8.h"
#include "lines/cutter.h"
#include "names/binder.h"
#include "program/two_threads.h"
#include "project/file_system.h"
#include "project/word_search.h"
#include "syntax/reader.h"

namespace quillet {

namespace {

std::atomic<SourceDecoder> decoder_of_all{nullptr};

constexpr Version kStubVersion = Version::Of(3, 14);

void AppendLatin1(Text bytes, std::string& out) {
  out.reserve(out.size() + bytes.size() + bytes.size() / 8);
  for (const char byte : bytes) AppendUtf8(static_cast<unsigned char>(byte), out);
}

// Makes UTF-8 of the bytes of a file in place.
void DecodeSource(std::string& bytes) {
  if (!NeedsHostDecoding(bytes)) return;
  std::string utf8;
  const SourceDecoder decode = decoder_of_all.load(std::memory_order_acquire);
  if (decode == nullptr || !decode(bytes, utf8)) {
    utf8.clear();
    AppendLatin1(bytes, utf8);
  }
  bytes = std::move(utf8);
}

// Where the lines of a source begin, as SourceText has it.
void FindLines(Text source, std::vector<uint32_t>& lines) {
  static constexpr Text kMark = "\xEF\xBB\xBF";
  lines.push_back(source.starts_with(kMark) ? static_cast<uint32_t>(kMark.size()) : 0);
  const bool has_returns = source.find('\r') != Text::npos;
  const auto find = [&](size_t from) {
    return has_returns ? source.find_first_of("\n\r", from) : source.find('\n', from);
  };
  for (size_t at = find(0); at != Text::npos; at = find(at + 1)) {
    if (source[at] == '\r' && source.substr(at + 1).starts_with('\n')) ++at;
    lines.push_back(static_cast<uint32_t>(at + 1));
  }
}

// Reads what a stamp was taken of, decoded; false where that cannot be.
bool ReadDecoded(const std::string& path, const FileStamp& stamp, std::string& bytes) {
  if (!stamp.is_file() || stamp.size > Files::kMaxSourceSize || !ReadSourceFile(path, bytes).empty()) return false;
  DecodeSource(bytes);
  return bytes.size() <= SourceText::kMaxSize;
}

}  // namespace

void SetSourceDecoder(SourceDecoder decoder) { decoder_of_all.store(decoder, std::memory_order_release); }

class Files::Impl {
  // Reads sources of a version.
  class SourceReader {
   public:
    explicit SourceReader(Version version) : version_(version), binder_(version), syntax_reader_(version) {}

    void Read(Text text, SourceFile& file) {
      file.source = SourceText::Copy(text);
      file.source->tokens.swap(tokens_);
      file.source->tokens.clear();
      rows_.clear();
      CutLinesCompletely(*file.source, version_, rows_);
      file.bindings = binder_.Bind(*file.source, rows_);
      syntax_.Clear();
      syntax_reader_.Read(*file.source, rows_, syntax_);
      file.syntax = syntax_;
      file.is_python2 = !version_.AtLeast(3, 0);
      tokens_.swap(file.source->tokens);
      file.source->tokens = {};
      if (tokens_.capacity() > kMostTokensKept) tokens_ = {};
    }

   private:
    static constexpr size_t kMostTokensKept = 1 << 20;

    Version version_;
    NameBinder binder_;
    SyntaxReader syntax_reader_;
    std::vector<Token> tokens_;
    std::vector<LineRow> rows_;
    FileSyntax syntax_;
  };
  // What a thread reads files with.
  struct Reader {
    std::optional<SourceReader> sources;
    std::optional<SourceReader> stubs;
    std::string memory;
  };

 public:
  explicit Impl(Version version) : version_(version) {}

  FileId NumberOf(Text path) {
    if (const auto found = numbers_.find(path); found != numbers_.end()) return found->second;
    std::string normal = NormalPath(path);
    if (const auto found = numbers_.find(Text(normal)); found != numbers_.end()) return found->second;
    const auto number = static_cast<FileId>(entries_.size());
    entries_.emplace_back();
    entries_.back().path = std::move(normal);
    numbers_.emplace(entries_.back().path, number);
    return number;
  }

  const std::string& PathOf(FileId file) const { return entries_[file].path; }
  bool IsOpen(FileId file) const { return entries_[file].buffer.has_value(); }
  bool IsStub(FileId file) const { return entries_[file].path.ends_with(".pyi"); }
  const std::vector<FileId>& Buffers() const { return buffers_; }
  size_t ByteSize() const { return held_; }

  bool Exists(FileId file) {
    Entry& entry = entries_[file];
    return entry.buffer.has_value() || StampOfEntry(entry).is_file();
  }

  const SourceFile* Get(FileId file) {
    Entry& entry = entries_[file];
    entry.asked = ++asked_;
    if (entry.file == nullptr && !entry.is_unreadable) Read(file, entry);
    return entry.file.get();
  }

  void ReadAhead(std::span<const FileId> files) {
    struct Wanted {
      FileId number;
      FileStamp stamp;
      std::unique_ptr<SourceFile> file;
    };
    std::vector<Wanted> wanted;
    for (const FileId number : files) {
      const Entry& entry = entries_[number];
      if (entry.file == nullptr && !entry.is_unreadable && !entry.buffer) wanted.push_back({number, {}, nullptr});
    }
    ForEachByThreads(wanted.size(), 2, readers_, [&](size_t i, Reader& reader) {
      Wanted& at = wanted[i];
      const std::string& path = entries_[at.number].path;
      at.stamp = StampOf(path);
      if (ReadDecoded(path, at.stamp, reader.memory)) at.file = Made(at.number, reader.memory, reader);
      if (reader.memory.capacity() > kMostMemoryKept) reader.memory = {};
    });
    for (Wanted& at : wanted) {
      Entry& entry = entries_[at.number];
      // Get says that it cannot be read, or that it has changed.
      if (at.file == nullptr || (entry.is_given_back && !IsSame(entry, at.file->text()))) continue;
      entry.is_given_back = false;
      entry.stamp = at.stamp;
      Hold(entry, std::move(at.file));
    }
  }

  Text SourceOf(FileId file, std::string& memory) const {
    const Entry& entry = entries_[file];
    if (entry.buffer) return *entry.buffer;
    if (entry.file != nullptr) return entry.file->text();
    if (!ReadDecoded(entry.path, StampOf(entry.path), memory)) return Text("");
    return memory;
  }

  const SourceFile* HeldAs(FileId file, const FileStamp& stamp) const {
    const Entry& entry = entries_[file];
    return entry.buffer || entry.stamp == stamp ? entry.file.get() : nullptr;
  }

  // One file's lines are kept: places are mostly asked in the order of files.
  Position PlaceOf(FileId file, uint32_t offset) {
    Entry& entry = entries_[file];
    if (entry.file != nullptr) return entry.file->PlaceOf(offset);
    if (lines_of_ != file) {
      std::string memory;
      const Text source = SourceOf(file, memory);
      if (entry.is_given_back && !IsSame(entry, source)) ThrowChanged(entry);
      lines_.clear();
      FindLines(source, lines_);
      lines_of_ = file;
    }
    const auto next = std::ranges::upper_bound(lines_, offset);
    if (next == lines_.begin()) return {1, 1};
    return {static_cast<int32_t>(next - lines_.begin()), static_cast<int32_t>(offset - *(next - 1)) + 1};
  }

  bool Refresh() {
    bool has_changed = false;
    lines_of_ = kNoFile;
    for (Entry& entry : entries_) {
      if (entry.buffer || !entry.stamp) continue;
      const FileStamp stamp = StampOf(entry.path);
      if (stamp == *entry.stamp) continue;
      const bool is_known = entry.file != nullptr || entry.is_given_back;
      entry.stamp = stamp;
      // One that was only written anew is the same.
      if (is_known && ReadDecoded(entry.path, stamp, memory_) && IsSame(entry, memory_)) {
        entry.is_unreadable = false;
        continue;
      }
      Drop(entry);
      has_changed = true;
    }
    return has_changed;
  }

  void Open(FileId file, std::string text) {
    Entry& entry = entries_[file];
    lines_of_ = kNoFile;
    text.resize(std::min(text.size(), SourceText::kMaxSize));
    if (!entry.buffer) buffers_.push_back(file);
    entry.buffer = std::move(text);
    if (entry.file == nullptr || entry.file->text() != *entry.buffer) Drop(entry);
  }

  void Change(FileId file, uint32_t begin, uint32_t end, Text text) {
    Entry& entry = entries_[file];
    if (!entry.buffer) {
      std::string content(SourceOf(file, memory_));
      Open(file, std::move(content));
    }
    std::string& buffer = *entry.buffer;
    const size_t from = std::min<size_t>(begin, buffer.size());
    const size_t to = std::clamp<size_t>(end, from, buffer.size());
    buffer.replace(from, to - from, text);
    buffer.resize(std::min(buffer.size(), SourceText::kMaxSize));
    lines_of_ = kNoFile;
    Drop(entry);
  }

  void Close(FileId file) {
    Entry& entry = entries_[file];
    if (!entry.buffer) return;
    std::erase(buffers_, file);
    lines_of_ = kNoFile;
    entry.buffer.reset();
    entry.stamp.reset();
    if (entry.file == nullptr) {
      Drop(entry);
    } else if (!ReadDecoded(entry.path, StampOfEntry(entry), memory_) || memory_ != entry.file->text()) {
      Drop(entry);
    }
  }

  void Trim(size_t bytes) {
    if (held_ <= bytes) return;
    std::vector<Entry*> held;
    for (Entry& entry : entries_) {
      if (entry.file != nullptr && !entry.buffer) held.push_back(&entry);
    }
    std::sort(held.begin(), held.end(), [](const Entry* a, const Entry* b) { return a->asked < b->asked; });
    for (Entry* entry : held) {
      if (held_ <= bytes) break;
      GiveBack(*entry);
    }
  }

  void GiveBack(FileId file) {
    if (IsHeld(file) && !IsOpen(file)) GiveBack(entries_[file]);
  }
  bool IsHeld(FileId file) const { return entries_[file].file != nullptr; }

 private:
  struct Entry {
    std::string path;
    std::unique_ptr<SourceFile> file;
    size_t byte_size = 0;  // of it
    uint64_t asked = 0;    // when it was asked for last
    bool is_unreadable = false;
    bool is_given_back = false;      // it was held, and may be asked for again
    uint64_t digest = 0;             // of what was
    std::optional<FileStamp> stamp;  // of what was read, or looked for
    std::optional<std::string> buffer;
  };

  static const FileStamp& StampOfEntry(Entry& entry) {
    if (!entry.stamp) entry.stamp = StampOf(entry.path);
    return *entry.stamp;
  }

  void Drop(Entry& entry) {
    entry.file.reset();
    held_ -= std::exchange(entry.byte_size, 0);
    entry.is_unreadable = false;
    entry.is_given_back = false;
  }

  void GiveBack(Entry& entry) {
    const uint64_t digest = DigestOf(entry.file->text());
    Drop(entry);
    entry.digest = digest;
    entry.is_given_back = true;
  }

  [[noreturn]] static void ThrowChanged(Entry& entry) {
    entry.stamp = FileStamp{.kind = FileStamp::Kind::kUnsettled};  // so that Refresh looks at it
    throw SourceChanged();
  }

  static uint64_t DigestOf(Text text) { return std::hash<Text>()(text); }

  // Whether a source is what was held of it.
  static bool IsSame(const Entry& entry, Text text) {
    return entry.file != nullptr ? text == entry.file->text() : DigestOf(text) == entry.digest;
  }

  void Read(FileId number, Entry& entry) {
    Text text;
    if (entry.buffer) {
      text = *entry.buffer;
    } else {
      // Before it is read: what is written in between is noticed later.
      const FileStamp stamp = StampOf(entry.path);
      entry.is_unreadable = !ReadDecoded(entry.path, stamp, memory_);
      if (entry.is_given_back && (entry.is_unreadable || !IsSame(entry, memory_))) {
        entry.is_unreadable = false;
        ThrowChanged(entry);
      }
      entry.is_given_back = false;
      entry.stamp = stamp;
      if (entry.is_unreadable) return;
      text = memory_;
    }
    Hold(entry, Made(number, text, readers_[0]));
    if (memory_.capacity() > kMostMemoryKept) memory_ = {};
  }

  std::unique_ptr<SourceFile> Made(FileId number, Text text, Reader& reader) const {
    auto file = std::make_unique<SourceFile>();
    file->id = number;
    file->path = entries_[number].path;
    file->is_stub = IsStub(number);
    std::optional<SourceReader>& sources = file->is_stub ? reader.stubs : reader.sources;
    if (!sources) sources.emplace(file->is_stub ? kStubVersion : version_);
    sources->Read(text, *file);
    return file;
  }

  void Hold(Entry& entry, std::unique_ptr<SourceFile> file) {
    entry.byte_size = file->ByteSize();
    held_ += entry.byte_size;
    entry.file = std::move(file);
  }

  static constexpr size_t kMostMemoryKept = size_t{4} << 20;

  const Version version_;
  std::deque<Entry> entries_;
  std::unordered_map<Text, FileId> numbers_;  // by the paths of the entries
  std::vector<FileId> buffers_;
  std::array<Reader, 2> readers_;
  std::string memory_;
  FileId lines_of_ = kNoFile;
  std::vector<uint32_t> lines_;  // where they begin
  size_t held_ = 0;
  uint64_t asked_ = 0;
};

Files::Files(Version version) : version_(version), impl_(std::make_unique<Impl>(version)) {}
Files::~Files() = default;

FileId Files::NumberOf(Text path) { return impl_->NumberOf(path); }
const std::string& Files::PathOf(FileId file) const { return impl_->PathOf(file); }
bool Files::Exists(FileId file) { return impl_->Exists(file); }
const SourceFile* Files::Get(FileId file) { return impl_->Get(file); }
void Files::ReadAhead(std::span<const FileId> files) { impl_->ReadAhead(files); }
Text Files::SourceOf(FileId file, std::string& memory) const { return impl_->SourceOf(file, memory); }

const SourceFile* Files::HeldAs(FileId file, const FileStamp& stamp) const { return impl_->HeldAs(file, stamp); }

Position Files::PlaceOf(FileId file, uint32_t offset) { return impl_->PlaceOf(file, offset); }

bool Files::Holds(FileId file, Text word) {
  std::string memory;
  return HoldsWord(SourceOf(file, memory), word);
}

bool Files::Refresh() { return impl_->Refresh(); }
void Files::Open(FileId file, std::string text) { impl_->Open(file, std::move(text)); }
void Files::Change(FileId file, uint32_t begin, uint32_t end, Text text) { impl_->Change(file, begin, end, text); }
void Files::Close(FileId file) { impl_->Close(file); }
bool Files::IsOpen(FileId file) const { return impl_->IsOpen(file); }
bool Files::IsStub(FileId file) const { return impl_->IsStub(file); }
Version Files::VersionOf(FileId file) const { return IsStub(file) ? kStubVersion : version_; }

void Files::ReadSource(FileId file, const FileStamp& stamp, std::string& memory) const {
  if (!ReadDecoded(PathOf(file), stamp, memory)) memory.clear();
}
const std::vector<FileId>& Files::Buffers() const { return impl_->Buffers(); }
void Files::Trim(size_t bytes) { impl_->Trim(bytes); }
void Files::GiveBack(FileId file) { impl_->GiveBack(file); }
bool Files::IsHeld(FileId file) const { return impl_->IsHeld(file); }
size_t Files::ByteSize() const { return impl_->ByteSize(); }

}  // namespace quillet
