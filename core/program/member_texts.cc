// Who asks binds or reads the file then, so a name too many costs time and no more. Names in comments and strings are
// left out, and variables that surely are those of functions or modules.
#include "program/member_texts.h"

#include <algorithm>

#include "program/blanks.h"
#include "program/text_steps.h"
#include "project/word_search.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// Where the line of a place begins, where what stands on it does, and how far that is indented.
struct Line {
  size_t begin, first, indent;
};
Line LineAround(Text source, size_t at) {
  static constexpr size_t kTab = 8;
  size_t begin = at;
  while (begin > 0 && !IsLineEnd(source[begin - 1])) --begin;
  size_t first = begin, indent = 0;
  for (; first < source.size() && IsBlank(source[first]); ++first)
    indent = source[first] == '\t' ? (indent / kTab + 1) * kTab : indent + 1;
  return {begin, first, indent};
}

bool BeginsWithWord(Text text, Text word) {
  return text.starts_with(word) && (text.size() == word.size() || IsBlank(text[word.size()]));
}

// Whether what stands behind a name lets it be a target.
bool MayFollowTarget(Text behind) {
  size_t at = 0;
  while (at < behind.size() && IsBlank(behind[at])) ++at;
  behind.remove_prefix(at);
  if (behind.empty()) return true;
  switch (behind.front()) {
    case '(':
    case '.':
    case '[':
      return false;
    case '=':
      return !behind.starts_with("==");
    case '+':
    case '-':
    case '*':
    case '/':
    case '%':
    case '@':
    case '&':
    case '|':
    case '^':
    case '<':
    case '>':
    case '!':
      return behind.substr(0, 3).find('=') != Text::npos;
    default:
      return true;
  }
}

size_t CountOf(Text text, Text mark) {
  size_t count = 0;
  for (size_t at = 0; (at = text.find(mark, at)) != Text::npos; at += mark.size()) ++count;
  return count;
}

// Whether a place lies in the body of a function or module rather than of a class, by what the lines in front of it
// that are less and less indented begin with. Where a string or a bracket may be open in between, that is not known.
bool IsSurelyLocal(Text source, size_t place, size_t& budget) {
  Line line = LineAround(source, place);
  size_t indent = line.indent;
  if (BeginsWithWord(source.substr(line.first), "class")) return false;
  bool is_in_function = false;
  while (!is_in_function && indent > 0 && line.begin > 0) {
    const size_t behind = line.begin;
    line = LineAround(source, behind - 1);
    if (budget < behind - line.begin) return false;
    budget -= behind - line.begin;
    const Text text = source.substr(line.first);
    if (line.indent >= indent || IsLineEnd(text.front()) || text.front() == '#') continue;
    if (BeginsWithWord(text, "class")) return false;
    if (!IsIdentifierByte(text.front()) && text.front() != '@') return false;
    indent = line.indent;
    is_in_function = BeginsWithWord(text, "def") || BeginsWithWord(text, "async");
  }
  const Text between = source.substr(line.begin, place - line.begin);
  if (budget < between.size()) return false;
  budget -= between.size();
  return CountOf(between, "\"\"\"") % 2 == 0 && CountOf(between, "'''") % 2 == 0;
}

// Whether an attribute at a place may be given something: alone, by an operator, or with others in front of a `=`, an
// `in` or a colon. Over several lines that is not told.
bool MayBeGiven(Text source, size_t at, size_t end) {
  if (!MayFollowTarget(source.substr(end))) return false;
  while (end < source.size() && IsBlank(source[end])) ++end;
  if (end == source.size()) return false;
  const size_t first = LineAround(source, at).first;
  const Text head = source.substr(first, at - first);
  const Text rest = source.substr(end, std::min(source.find_first_of("\n\r", end), source.size()) - end);
  switch (source[end]) {
    case ',':
    case ')':
    case ']':
      return rest.find('=') != Text::npos || rest.find(" in ") != Text::npos || rest.ends_with(',') ||
             rest.ends_with('(') || rest.ends_with('\\') || HoldsWord(head, "as");
    case ':':  // of an annotation
      return std::ranges::all_of(head, [](char c) { return IsIdentifierByte(c) || c == '.'; }) ||
             HoldsWord(head, "as") || rest.find('=') != Text::npos;
    case 'i':
      return HoldsWord(head, "for");
    default:
      return !IsIdentifierByte(source[end]) && !IsLineEnd(source[end]) && source[end] != '#' && source[end] != '}';
  }
}

}  // namespace

bool MayDefineMember(Text source, Text name) {
  static constexpr Text kReceiver = "self.";
  static constexpr size_t kMostLooks = 8;
  size_t budget = kMostLooks * source.size();  // bytes that are looked at again
  TextSteps steps(source);
  for (size_t at = 0; (at = FindWord(source, name, at)) != Text::npos; at += name.size()) {
    if (steps.At(at) == TextSteps::Around::kText) continue;
    const Text behind = source.substr(at + name.size());
    size_t before = at;
    while (before > 0 && IsBlank(source[before - 1])) --before;
    if (before > 0 && source[before - 1] == '.') {
      const bool is_of_self = before == at ? source.substr(0, at).ends_with(kReceiver) : true;
      if (is_of_self && MayFollowTarget(behind)) return true;
      continue;
    }
    const Text head = source.substr(0, before);
    if (head.ends_with("def") || head.ends_with("class")) {
      if (LineAround(source, at).indent > 0) return true;
      continue;
    }
    if (MayFollowTarget(behind) && !IsSurelyLocal(source, at, budget)) return true;
  }
  return false;
}

bool MayGiveMember(Text source, Text name) {
  static constexpr size_t kMostLooks = 8;
  size_t budget = kMostLooks * source.size();  // bytes that are looked at again
  const bool has_slots = HoldsWord(source, "__slots__");
  TextSteps steps(source);
  for (size_t at = 0; (at = FindWord(source, name, at)) != Text::npos; at += name.size()) {
    if (steps.At(at) == TextSteps::Around::kText) {
      if (has_slots) return true;
      continue;
    }
    size_t before = at;
    while (before > 0 && IsBlank(source[before - 1])) --before;
    const Text head = source.substr(0, before);
    if (head.ends_with('.')) {
      if (MayBeGiven(source, at, at + name.size())) return true;
    } else if (head.ends_with("def") || head.ends_with("class")) {
      if (LineAround(source, at).indent > 0) return true;
    } else if (MayFollowTarget(source.substr(at + name.size())) && !IsSurelyLocal(source, at, budget)) {
      return true;
    }
  }
  return false;
}

}  // namespace quillet
