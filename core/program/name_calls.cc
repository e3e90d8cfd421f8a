// Only what stands in code counts, up to the first place that may call the name.
#include "program/name_calls.h"

#include "program/blanks.h"
#include "program/text_steps.h"
#include "project/word_search.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// Whether a bracket follows, in brackets as well, and it is not that of a definition.
bool MayBeCall(Text source, size_t begin, size_t end) {
  while (end < source.size() &&
         (IsBlank(source[end]) || IsLineEnd(source[end]) || source[end] == '\\' || source[end] == ')'))
    ++end;
  if (end == source.size() || (source[end] != '(' && source[end] != '#')) return false;
  while (begin > 0 && IsBlank(source[begin - 1])) --begin;
  const Text head = source.substr(0, begin);
  return !head.ends_with("def") && !head.ends_with("class");
}

// Whether the line begins as that of a decorator; one that goes over several lines has its name on the first.
bool MayBeDecorator(Text source, size_t at) {
  while (at > 0 && !IsLineEnd(source[at - 1])) --at;
  while (at < source.size() && IsBlank(source[at])) ++at;
  return source[at] == '@';
}

}  // namespace

NameUse UseOfName(Text source, Text name) {
  NameUse use = NameUse::kNone;
  TextSteps steps(source);
  for (size_t at = FindWord(source, name); at != Text::npos; at = FindWord(source, name, at + name.size())) {
    const TextSteps::Around around = steps.At(at);
    if (around == TextSteps::Around::kText) continue;
    if (around == TextSteps::Around::kUnknown || MayBeCall(source, at, at + name.size()) || MayBeDecorator(source, at))
      return NameUse::kMayBeCalled;
    use = NameUse::kMentioned;
  }
  return use;
}

}  // namespace quillet
