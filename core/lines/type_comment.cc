// Type comments are told from prose by what stands in front of "type:": a comment sign and nothing
// else, though other words may stand in front of that sign ("# see below # type: int").
#include "lines/type_comment.h"

#include "foundations/utf8.h"

namespace quillet {

namespace {

bool IsSpace(uint32_t code_point) { return (CharClassOf(code_point) & kCharSpace) != 0; }

// The length of the text without the white space at its end.
size_t StrippedLength(Text text) {
  size_t end = text.size();
  while (end > 0) {
    size_t lead = end - 1;
    while (lead > 0 && !IsUtf8LeadByte(text[lead])) --lead;
    const DecodedChar last = DecodeUtf8(text.data() + lead, text.data() + end);
    if (last.length != end - lead || !IsSpace(last.code_point)) break;
    end = lead;
  }
  return end;
}

size_t LeadingSpace(Text text) {
  size_t at = 0;
  while (at < text.size()) {
    const DecodedChar next = DecodeUtf8(text.data() + at, text.data() + text.size());
    if (next.length == 0 || !IsSpace(next.code_point)) break;
    at += next.length;
  }
  return at;
}

}  // namespace

TypeCommentHint FindTypeCommentHint(Text comment) {
  constexpr Text kMark = "type:";
  const size_t mark = comment.find(kMark);
  if (mark == Text::npos) return {};
  const size_t front = StrippedLength(comment.substr(0, mark));
  if (front == 0 || comment[front - 1] != '#') return {};
  const size_t begin = mark + kMark.size();
  Text hint = comment.substr(begin);
  hint = hint.substr(0, hint.find('#'));
  hint = hint.substr(0, StrippedLength(hint));
  if (hint.substr(LeadingSpace(hint)) == "ignore") return {};
  return {true, begin, begin + hint.size()};
}

}  // namespace quillet
