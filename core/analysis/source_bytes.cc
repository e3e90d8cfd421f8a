// Reading by the operating system's own calls, and the encoding line of PEP 263.
#include "analysis/source_bytes.h"

#include <algorithm>
#include <cerrno>
#include <system_error>

#include "foundations/file_status.h"
#include "foundations/stop.h"
#include "foundations/utf8.h"

#ifdef _WIN32
#include <cstdio>
#include <filesystem>
#else
#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>
#endif

namespace quillet {

namespace {

constexpr size_t kReadSize = size_t{1} << 16;

std::string ReasonOf(int error) { return std::generic_category().message(error); }

std::string TooLarge(size_t most_bytes) {
  return "the source is too large: more than " + std::to_string(most_bytes >> 20) + " MiB";
}

// Calls `read(at, size)`, which gives the number of bytes read, 0 at the end, or -1, until the end. Empty, or
// why there is none. `expected` is what the size of the file is thought to be.
template <class Function>
std::string ReadAll(size_t expected, size_t most_bytes, std::string& bytes, Function&& read) {
  if (expected > most_bytes) return TooLarge(most_bytes);
  size_t size = 0;
  // One byte more than expected, so that the end is met without growing.
  bytes.resize(std::max(expected + 1, kReadSize));
  while (true) {
    const auto count = read(bytes.data() + size, bytes.size() - size);
    CountSteps(count / 16);
    if (count < 0) return ReasonOf(errno);
    if (count == 0) break;
    size += static_cast<size_t>(count);
    if (size > most_bytes) {
      std::string().swap(bytes);
      return TooLarge(most_bytes);
    }
    if (size == bytes.size()) bytes.resize(std::min(size * 2, most_bytes + 1));
  }
  bytes.resize(size);
  return {};
}

}  // namespace

#ifdef _WIN32

std::string ReadSourceFile(const std::string& path, std::string& bytes, size_t most_bytes) {
  if (path.find('\0') != std::string::npos) return "embedded null byte";
  const std::filesystem::path wide(std::u8string(path.begin(), path.end()));
  std::FILE* file = _wfopen(wide.c_str(), L"rb");
  if (file == nullptr) return ReasonOf(errno);
  std::string problem = ReadAll(0, most_bytes, bytes, [&](char* at, size_t size) -> int64_t {
    const size_t count = std::fread(at, 1, size, file);
    return count == 0 && std::ferror(file) ? -1 : static_cast<int64_t>(count);
  });
  std::fclose(file);
  return problem;
}

#else

namespace {

// How long a read of a pipe waits before it looks whether it is still wanted.
constexpr int kPollMilliseconds = 100;

class OpenFile {
 public:
  explicit OpenFile(const std::string& path) : descriptor_(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK)) {}
  ~OpenFile() {
    if (descriptor_ >= 0) close(descriptor_);
  }
  OpenFile(const OpenFile&) = delete;
  OpenFile& operator=(const OpenFile&) = delete;
  int get() const { return descriptor_; }

 private:
  int descriptor_;
};

// Waits until there is something to read.
void WaitForInput(int descriptor) {
  while (true) {
    pollfd wanted{descriptor, POLLIN, 0};
    const int ready = poll(&wanted, 1, kPollMilliseconds);
    if (ready > 0 || (ready < 0 && errno != EINTR)) return;
    AskWhetherToStop();
  }
}

}  // namespace

std::string ReadSourceFile(const std::string& path, std::string& bytes, size_t most_bytes) {
  if (path.find('\0') != std::string::npos) return "embedded null byte";
  const OpenFile file(path);
  if (file.get() < 0) return ReasonOf(errno);
  struct stat info;
  if (fstat(file.get(), &info) != 0) return ReasonOf(errno);
  if (S_ISDIR(info.st_mode)) return ReasonOf(EISDIR);
  if (const Text problem = DeviceProblem(file.get()); !problem.empty()) return std::string(problem);
  const bool is_regular = S_ISREG(info.st_mode);
  const size_t expected = is_regular ? static_cast<size_t>(info.st_size) : 0;
  return ReadAll(expected, most_bytes, bytes, [&](char* at, size_t size) -> ssize_t {
    while (true) {
      if (!is_regular) WaitForInput(file.get());
      const ssize_t count = read(file.get(), at, size);
      if (count >= 0 || (errno != EINTR && errno != EAGAIN)) return count;
    }
  });
}

#endif

// ---- encodings ----

namespace {

constexpr Text kUtf8Mark = "\xEF\xBB\xBF";

bool IsEncodingChar(char c) {
  return (AsciiClassOf(c) & (kAsciiAlpha | kAsciiDigit | kAsciiUnderscore)) != 0 || c == '-' || c == '.';
}

// The first line of a text without its end.
Text FirstLine(Text text) { return text.substr(0, text.find_first_of("\r\n")); }

Text BehindFirstLine(Text text) {
  const size_t size = FirstLine(text).size();
  return text.substr(std::min(text.size(), size + (text.substr(size, 2) == "\r\n" ? 2 : 1)));
}

// The encoding that a line names; empty without one. A comment may stand behind blanks alone, and the
// name behind "coding:" or "coding=" anywhere in it.
Text EncodingOfLine(Text line) {
  const size_t comment = line.find_first_not_of(" \t\f");
  if (comment == Text::npos || line[comment] != '#') return {};
  for (size_t at = line.find("coding", comment); at != Text::npos; at = line.find("coding", at + 1)) {
    Text rest = line.substr(at + 6);
    if (rest.empty() || (rest[0] != ':' && rest[0] != '=')) continue;
    rest.remove_prefix(1);
    rest.remove_prefix(std::min(rest.find_first_not_of(" \t"), rest.size()));
    const auto end = std::find_if_not(rest.begin(), rest.end(), IsEncodingChar);
    if (end != rest.begin()) return rest.substr(0, static_cast<size_t>(end - rest.begin()));
  }
  return {};
}

bool IsBlankOrComment(Text line) {
  const size_t first = line.find_first_not_of(" \t\f");
  return first == Text::npos || line[first] == '#';
}

bool IsUtf8(Text encoding) {
  std::string name(encoding);
  for (char& c : name) c = c == '_' ? '-' : c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
  return name == "utf8" || name == "u8" || name == "utf-8" || name.starts_with("utf-8-");
}

}  // namespace

bool NeedsHostDecoding(Text bytes) {
  if (bytes.starts_with(kUtf8Mark)) return false;
  if (bytes.starts_with("\xFF\xFE") || bytes.starts_with("\xFE\xFF")) return true;
  if (bytes.starts_with(Text("\0\0\xFE\xFF", 4))) return true;
  const Text first = FirstLine(bytes);
  Text encoding = EncodingOfLine(first);
  if (encoding.empty() && first.size() < bytes.size() && IsBlankOrComment(first))
    encoding = EncodingOfLine(FirstLine(BehindFirstLine(bytes)));
  return !encoding.empty() && !IsUtf8(encoding);
}

}  // namespace quillet
