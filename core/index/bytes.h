// Integers and texts in a row of bytes: seven bits a byte, the low ones first, and a text behind its size.
//
// A reader may be given any bytes. It never reads behind them; what is not there is 0 or empty, and the
// reader says so from then on.
#pragma once

#include <cstdint>
#include <cstring>
#include <string>

#include "foundations/text.h"

namespace quillet {

inline void AppendNumber(uint64_t value, std::string& out) {
  while (value > 0x7F) {
    out += static_cast<char>(value | 0x80);
    value >>= 7;
  }
  out += static_cast<char>(value);
}

inline void AppendText(Text text, std::string& out) {
  AppendNumber(text.size(), out);
  out += text;
}

// Eight bytes, the low one first whatever the machine.
inline void AppendFixed(uint64_t value, std::string& out) {
  for (int i = 0; i < 8; ++i) out += static_cast<char>(value >> (8 * i));
}

class ByteReader {
 public:
  explicit ByteReader(Text bytes) : at_(bytes.data()), end_(bytes.data() + bytes.size()) {}

  bool failed() const { return failed_; }
  size_t left() const { return static_cast<size_t>(end_ - at_); }
  Text Rest() const { return {at_, left()}; }

  uint64_t Number() {
    if (at_ < end_ && static_cast<unsigned char>(*at_) < 0x80) [[likely]]
      return static_cast<unsigned char>(*at_++);
    uint64_t value = 0;
    for (int shift = 0; shift < 64 && at_ < end_; shift += 7) {
      const auto byte = static_cast<unsigned char>(*at_++);
      value |= uint64_t{byte & 0x7Fu} << shift;
      if (byte < 0x80) return value;
    }
    return Fail();
  }
  // A number that must be at most `limit`.
  uint64_t NumberUpTo(uint64_t limit) {
    const uint64_t value = Number();
    return value <= limit ? value : Fail();
  }
  Text Bytes(size_t size) {
    if (size > left()) {
      Fail();
      return Text("");
    }
    at_ += size;
    return {at_ - size, size};
  }
  Text String() { return Bytes(NumberUpTo(SIZE_MAX)); }
  uint64_t Fixed() {
    const Text bytes = Bytes(8);
    uint64_t value = 0;
    for (size_t i = bytes.size(); i-- > 0;) value = value << 8 | static_cast<unsigned char>(bytes[i]);
    return value;
  }

 private:
  uint64_t Fail() {
    failed_ = true;
    at_ = end_;
    return 0;
  }

  const char* at_;
  const char* end_;
  bool failed_ = false;
};

}  // namespace quillet
