// Composing info strings and taking them apart again.
//
// Composing never looks into what it is given. Taking apart looks at the prefix, or at the end of a
// plain text for the suffix that means an instance, and splits at the first separator the form has.
#include "foundations/strutils.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {

void AppendInstanceNameForClass(Text cls_name, std::string& out) {
  out += cls_name;
  out += kClassInstanceSuffix;
}

void AppendLiteralInfo(Text cls_name, Text literal, std::string& out) {
  out += kTypedLiteralPrefix;
  AppendInstanceNameForClass(cls_name, out);
  if (IsNone(literal)) return;
  out += ' ';
  out += literal;
}

void AppendArgInfo(int64_t index, Text info, std::string& out) {
  out += kArgPrefix;
  AppendInteger(index, out);
  if (IsNone(info)) return;
  out += ' ';
  out += info;
}

std::string EnsureScopeNameIndicies(Text name) {
  constexpr Text kFirst = "#0";
  static_assert(kFirst.starts_with(kScopeIndexSep));
  std::string result;
  result.reserve(name.size());
  while (!name.empty()) {
    const size_t part_size = std::min(name.find('.'), name.size());
    const Text part = name.substr(0, part_size);
    result += part.ends_with(kFirst) ? part.substr(0, part.size() - kFirst.size()) : part;
    if (part_size == name.size()) break;
    result += '.';
    name.remove_prefix(part_size + 1);
  }
  return result;
}

Text NameOfInfoKind(char kind) {
  switch (kind) {
#define QUILLET_INFO_KIND(name, byte) \
  case byte:                          \
    return #name;
#include "vocabulary/kinds.def"
    case kPlainEquivKind:
      return "PlainEquiv";
    default:
      return {};
  }
}

namespace {

constexpr Text kYieldFrom = "from ";

// The detail up to the first `separator` and what follows it; the whole detail where there is none.
void SplitAt(Text separator, Text detail, DecodedInfo& decoded) {
  const size_t at = detail.find(separator);
  decoded.first = detail.substr(0, at);
  if (at != Text::npos) decoded.second = detail.substr(at + separator.size());
}

void DecodePlain(Text info, DecodedInfo& decoded) {
  if (info.starts_with(kYieldFrom)) {
    decoded.kind = "YieldFrom";
    decoded.first = info.substr(kYieldFrom.size());
  } else if (info.size() > kClassInstanceSuffix.size() && info.ends_with(kClassInstanceSuffix)) {
    decoded.kind = NameOfInfoKind(kInstanceKind);
    decoded.first = info.substr(0, info.size() - kClassInstanceSuffix.size());
  } else {
    decoded.first = info;
  }
}

}  // namespace

DecodedInfo DecodeInfo(Text info) {
  const char kind = GetInfoBytesKind(info);
  const Text detail = DetailOfInfo(info);
  DecodedInfo decoded{NameOfInfoKind(kind)};
  switch (kind) {
    case kPlainEquivKind:
      // ":=:" is no prefix; a text that begins so is taken for what it looks like.
      DecodePlain(info, decoded);
      break;
    case kSetKind:
    case kGetKind:
    case kGlobalKind:
    case kNonlocalKind:
      break;
    case kFromImportKind:
    case kArgKind:
      SplitAt(" ", detail, decoded);
      break;
    case kTypeParameterKind: {
      const size_t stars = std::min(detail.find_first_not_of('*'), detail.size());
      if (stars > 0) decoded.first = detail.substr(0, stars);
      // A blank parts the stars from a bound, which may itself begin with a star.
      const Text rest = detail.substr(stars);
      if (!rest.empty()) decoded.second = rest.substr(stars > 0 && rest[0] == ' ' ? 1 : 0);
      break;
    }
    case kTypedLiteralKind:
      SplitAt(": ", detail, decoded);
      if (IsNone(decoded.second) && decoded.first.ends_with(kClassInstanceSuffix)) {
        decoded.first.remove_suffix(kClassInstanceSuffix.size());
      }
      break;
    default:
      decoded.first = detail;
  }
  return decoded;
}

}  // namespace quillet
