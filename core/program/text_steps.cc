#include "program/text_steps.h"

#include <algorithm>

#include "project/word_search.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// The first of the given bytes from one place to another, or the latter.
template <char... kBytes>
size_t FindBetween(Text source, size_t from, size_t to) {
  static constexpr size_t kLoaded = 16;  // behind where it may still begin to look
  const char* const bytes = source.data();
  if (source.size() > kLoaded) {
    const size_t safe = std::min(to, source.size() - kLoaded);
    if (from < safe) {
      from = static_cast<size_t>(FindAny<kBytes...>(bytes + from, bytes + safe) - bytes);
      if (from < safe) return from;
    }
  }
  while (from < to && ((source[from] != kBytes) && ...)) ++from;
  return from;
}

bool IsOfFormattedPrefix(char byte) { return byte == 'f' || byte == 'F' || byte == 't' || byte == 'T'; }

}  // namespace

size_t TextSteps::FindMark(size_t place) const { return FindBetween<'#', '"', '\''>(source_, end_, place); }

void TextSteps::StepOver() {
  may_hold_code_ = false;
  if (source_[end_] == '#') {
    end_ = FindBetween<'\n', '\r'>(source_, end_, source_.size());
  } else {
    StepOverString();
  }
}

void TextSteps::StepOverString() {
  static constexpr size_t kLongestPrefix = 2;
  const size_t begin = end_, size = source_.size();
  for (size_t at = begin; at > 0 && begin - at < kLongestPrefix && IsIdentifierByte(source_[at - 1]); --at)
    may_hold_code_ = may_hold_code_ || IsOfFormattedPrefix(source_[at - 1]);
  const char quote = source_[begin];
  const Text marks = source_.substr(begin, 3);
  if (marks != "\"\"\"" && marks != "'''") {
    for (end_ = begin + 1; end_ < size; end_ += 2) {
      end_ = quote == '"' ? FindBetween<'"', '\\', '\n', '\r'>(source_, end_, size)
                          : FindBetween<'\'', '\\', '\n', '\r'>(source_, end_, size);
      if (end_ == size || source_[end_] == '\\') continue;
      if (source_[end_] == quote) ++end_;
      return;
    }
  } else {
    for (end_ = begin + 3; end_ < size;) {
      end_ = quote == '"' ? FindBetween<'"', '\\'>(source_, end_, size) : FindBetween<'\'', '\\'>(source_, end_, size);
      if (end_ == size) break;
      if (source_[end_] == '\\') {
        end_ += 2;
      } else if (source_.substr(end_, 3) == marks) {
        end_ += 3;
        return;
      } else {
        ++end_;
      }
    }
  }
  end_ = size;
  may_hold_code_ = true;
}

}  // namespace quillet
