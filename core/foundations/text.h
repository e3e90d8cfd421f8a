// Text as the core passes it around: a borrowed view of UTF-8 bytes, or "none".
//
// A Text never owns. Whoever hands one out says what keeps the bytes alive (a SourceText, a
// NodePool, a RecordStore or a static string). The absent text is a view without data, so
// "no text" and "empty text" stay apart, as the host's None and "" do.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace quillet {

using Text = std::string_view;

inline constexpr Text kNoText{};

inline bool IsNone(Text text) { return text.data() == nullptr; }

// A place in a text: both counted from 0, the column in UTF-8 bytes.
struct Position {
  int32_t line = 0;
  int32_t col = 0;
  friend bool operator==(const Position&, const Position&) = default;
};

// The version of Python under analysis, compared as the host compares tuples: (3,) < (3, 0).
struct Version {
  int parts[3] = {3, 8, 0};
  int count = 3;

  static constexpr Version Of(int major, int minor) { return Version{{major, minor, 0}, 2}; }

  constexpr bool AtLeast(int major, int minor) const {
    if (count < 1) return false;
    if (parts[0] != major) return parts[0] > major;
    if (count < 2) return false;
    return parts[1] >= minor;
  }
};

}  // namespace quillet
