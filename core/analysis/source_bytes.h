// The bytes of a file, read without a host, and whether they can be analysed as they are.
//
// Nearly all sources are UTF-8. One that names another encoding in one of its first two lines, or
// begins with the byte order mark of UTF-16 or UTF-32, must be decoded by a host that knows encodings.
// The trap: a named file may be a pipe that nobody writes to, and a reader that waits for it must still
// be stoppable.
#pragma once

#include <cstddef>
#include <string>

#include "foundations/text.h"

namespace quillet {

// What is longer is not read: a pipe need not have an end.
constexpr size_t kMostBytesRead = size_t{1} << 30;

// Reads a whole file into `bytes`, whose memory is kept. Empty, or why it could not be read, as one
// phrase. `path` is as the operating system spells it (UTF-8 on Windows). May be stopped (stop.h).
std::string ReadSourceFile(const std::string& path, std::string& bytes, size_t most_bytes = kMostBytesRead);

// Whether a source names an encoding other than UTF-8 for itself.
bool NeedsHostDecoding(Text bytes);

}  // namespace quillet
