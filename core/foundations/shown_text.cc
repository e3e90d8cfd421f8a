// A walk over characters that copies runs of good ones whole.
#include "foundations/shown_text.h"

#include "foundations/utf8.h"

namespace quillet {

void AppendShown(Text text, std::string& out) {
  constexpr char kDigits[] = "0123456789abcdef";
  const char* const end = text.data() + text.size();
  const char* good = text.data();
  for (const char* at = good; at < end;) {
    const DecodedChar c = DecodeUtf8(at, end);
    if (c.length != 0) {
      at += c.length;
      continue;
    }
    const auto byte = static_cast<unsigned char>(*at);
    out.append(good, at).append("\\x").append(1, kDigits[byte >> 4]).append(1, kDigits[byte & 15]);
    good = ++at;
  }
  out.append(good, end);
}

}  // namespace quillet
