// Kinds by their byte, details by the length of a prefix; one phrase a kind.
#include "analysis/record_words.h"

#include <algorithm>
#include <array>

#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

constexpr char kNoInfoKind = '\0';
constexpr Text kYieldFrom = "from ";

constexpr Text kWords[] = {
#define QUILLET_RECORD_KIND(identifier, word, info_kind) word,
#include "analysis/record_kinds.def"
};

constexpr std::array<RecordKind, 256> kKindOfByte = [] {
  std::array<RecordKind, 256> kinds{};
  kinds.fill(RecordKind::kOther);
#define QUILLET_RECORD_KIND(identifier, word, info_kind) \
  if (info_kind != kNoInfoKind) kinds[static_cast<uint8_t>(info_kind)] = RecordKind::k##identifier;
#include "analysis/record_kinds.def"
  return kinds;
}();

Text WithoutInstanceSuffix(Text text) {
  if (text.ends_with(kClassInstanceSuffix)) text.remove_suffix(kClassInstanceSuffix.size());
  return text;
}

RecordInWords DecodeInner(Text info) {
  const char byte = GetInfoBytesKind(info);
  if (byte == kPlainEquivKind && !info.starts_with(":=")) {
    const RecordKind kind = info.ends_with(kClassInstanceSuffix) ? RecordKind::kInstance : RecordKind::kEqual;
    return {kind, WithoutInstanceSuffix(info)};
  }
  const RecordKind kind = kKindOfByte[static_cast<uint8_t>(byte)];
  if (kind == RecordKind::kOther) return {kind, info};
  const Text detail = info.substr(std::min<size_t>(kPrefixLen, info.size()));
  return {kind, kind == RecordKind::kLiteral ? WithoutInstanceSuffix(detail) : detail};
}

// "str: 'a'" is 'a' (str), "list" alone a list.
void AppendLiteralDescription(Text detail, std::string& out) {
  Text start;
  if (detail.starts_with("from ")) {
    start = detail.substr(0, 5);
    detail.remove_prefix(5);
  }
  const size_t colon = detail.find(": ");
  const Text cls = detail.substr(0, colon);
  const Text text = colon == Text::npos ? Text() : detail.substr(colon + 2);
  out.append("= ").append(start);
  if (text.empty()) {
    const bool is_vowel = cls.empty() || Text("aeiou").find(cls[0]) != Text::npos;
    out.append(is_vowel ? "an " : "a ").append(cls);
  } else {
    out += text;
    // None is its own class.
    if (text != cls) out.append(" (").append(cls).append(")");
  }
}

}  // namespace

std::span<const Text> RecordKindWords() { return kWords; }

RecordInWords DecodeInfo(Text info, std::string& buffer) {
  // What `yield from` yields from is itself an info string behind the word. Nothing else begins with
  // the word and a blank, since `from` is no name.
  if (!info.starts_with(kYieldFrom)) return DecodeInner(info);
  RecordInWords record = DecodeInner(info.substr(kYieldFrom.size()));
  const Text inner = record.detail;
  if (!inner.empty() && inner.data() == info.data() + kYieldFrom.size()) {
    record.detail = info.substr(0, kYieldFrom.size() + inner.size());
    return record;
  }
  buffer.assign(inner.empty() ? kYieldFrom.substr(0, kYieldFrom.size() - 1) : kYieldFrom).append(inner);
  record.detail = buffer;
  return record;
}

void AppendDescription(const RecordInWords& record, bool is_parameter, std::string& out) {
  const Text detail = record.detail;
  switch (record.kind) {
    case RecordKind::kSet:
      out += is_parameter ? "parameter" : "set";
      return;
    case RecordKind::kGet:
      out += "read";
      return;
    case RecordKind::kWithinExpr:
      out.append("set inside the expression, at token ").append(detail);
      return;
    case RecordKind::kCalled:
      out.append("called with ").append(detail);
      return;
    case RecordKind::kImport:
      out.append("import ").append(detail);
      return;
    case RecordKind::kFromImport: {
      const size_t blank = detail.rfind(' ');
      const Text module = blank == Text::npos ? Text() : detail.substr(0, blank);
      out.append("from ").append(module).append(" import ").append(detail.substr(blank + 1));
      return;
    }
    case RecordKind::kImportAs:
      out.append("imported as ").append(detail);
      return;
    case RecordKind::kGlobal:
      out += "declared global";
      return;
    case RecordKind::kNonlocal:
      out += "declared nonlocal";
      return;
    case RecordKind::kTypeParameter:
      out += "type parameter";
      if (!detail.empty()) out.append(" ").append(detail);
      return;
    case RecordKind::kExpression:
    case RecordKind::kEqual:
      out.append("= ").append(detail.empty() ? Text("nothing") : detail);
      return;
    case RecordKind::kLiteral:
      return AppendLiteralDescription(detail, out);
    case RecordKind::kHint:
      out.append("hint ").append(detail);
      return;
    case RecordKind::kInstance:
      out.append("instance of ").append(detail);
      return;
    case RecordKind::kOther:
      out += detail;
      return;
  }
}

void AppendArgumentPlace(Text name, std::string& out) {
  out.append("<argument ").append(name.substr(kPrefixLen)).append(">");
}

}  // namespace quillet
