// Sixty-four bytes become two masks: those of words, whose edges give the words, and those of `=` and `:`, from which
// the targets are read backwards. What is behind a keyword is read forwards, as there are few of them.
//
// The trap is a source in which many targets seem to have no beginning: what may be read twice has a budget.
#include "project/word_filters.h"

#include <algorithm>
#include <bit>
#include <cstring>

#include "foundations/stop.h"
#include "project/word_search.h"

namespace quillet {

namespace {

// Zeros behind a source, so that blocks and words are read without asking where it ends.
constexpr size_t kSpare = 80;
// What is said of the work that is done, and how often.
constexpr size_t kBytesBetweenCounts = 1 << 14;
constexpr int64_t kStepsOfCount = 1 << 10;
constexpr size_t kBitsOfAKey = 16;
constexpr int kProbes = 4;

// Of at most eight bytes, the first one lowest.
constexpr uint64_t NumberOfWord(Text word) {
  uint64_t number = 0;
  for (size_t i = 0; i < word.size(); ++i) number |= uint64_t{static_cast<unsigned char>(word[i])} << (8 * i);
  return number;
}

uint64_t LoadEight(const char* at) {
  if constexpr (std::endian::native != std::endian::little) return NumberOfWord(Text(at, 8));
  uint64_t bytes;
  std::memcpy(&bytes, at, sizeof(bytes));
  return bytes;
}

// The last bytes of a word, one to eight of them, as a number; eight can be read at `at`.
uint64_t TailOf(const char* at, size_t size) { return LoadEight(at) & (~uint64_t{0} >> (64 - 8 * size)); }

constexpr uint64_t kDefWord = NumberOfWord("def");
constexpr uint64_t kClassWord = NumberOfWord("class");
constexpr uint64_t kAsWord = NumberOfWord("as");
constexpr uint64_t kForWord = NumberOfWord("for");

// Never 0.
WordKey MixedKey(uint64_t seed, uint64_t tail) {
  uint64_t key = (seed ^ tail) * 0x9E3779B97F4A7C15;
  key ^= key >> 32;
  key *= 0xD6E8FEB86659FD93;
  return (key ^ (key >> 29)) | 1;
}

// Of a word behind which eight bytes can be read.
WordKey KeyAt(const char* at, size_t size) {
  uint64_t seed = size;
  for (; size > 8; at += 8, size -= 8) {
    seed = (seed ^ LoadEight(at)) * 0xA0761D6478BD642F;
    seed ^= seed >> 32;
  }
  return MixedKey(seed, TailOf(at, size));
}

WordKey DefinitionOf(WordKey word) { return MixedKey(word, 0x5DEECE66D); }
WordKey MemberOf(WordKey word) { return MixedKey(word, 0x2545F4914F6CDD1D); }

struct BlockMasks {
  uint64_t names;  // bytes of words
  uint64_t marks;  // `=` and `:`
};

BlockMasks MasksOf(const char* block) {
  BlockMasks masks{0, 0};
#if defined(__SSE2__)
  for (int i = 0; i < 4; ++i) {
    const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i*>(block + 16 * i));
    const __m128i lower = _mm_or_si128(bytes, _mm_set1_epi8(0x20));
    const __m128i letters =
        _mm_and_si128(_mm_cmpgt_epi8(lower, _mm_set1_epi8('a' - 1)), _mm_cmplt_epi8(lower, _mm_set1_epi8('z' + 1)));
    const __m128i digits =
        _mm_and_si128(_mm_cmpgt_epi8(bytes, _mm_set1_epi8('0' - 1)), _mm_cmplt_epi8(bytes, _mm_set1_epi8('9' + 1)));
    const __m128i underscores = _mm_cmpeq_epi8(bytes, _mm_set1_epi8('_'));
    // Bytes beyond ASCII have the bit that is asked for.
    const __m128i names = _mm_or_si128(_mm_or_si128(letters, digits), _mm_or_si128(underscores, bytes));
    const __m128i marks =
        _mm_or_si128(_mm_cmpeq_epi8(bytes, _mm_set1_epi8('=')), _mm_cmpeq_epi8(bytes, _mm_set1_epi8(':')));
    masks.names |= uint64_t{static_cast<uint32_t>(_mm_movemask_epi8(names))} << (16 * i);
    masks.marks |= uint64_t{static_cast<uint32_t>(_mm_movemask_epi8(marks))} << (16 * i);
  }
#else
  for (int i = 0; i < 64; ++i) {
    masks.names |= uint64_t{IsIdentifierByte(block[i])} << i;
    masks.marks |= uint64_t{block[i] == '=' || block[i] == ':'} << i;
  }
#endif
  return masks;
}

bool IsDigitByte(char byte) { return byte >= '0' && byte <= '9'; }
bool IsBlankByte(char byte) { return byte == ' ' || byte == '\t' || byte == '\f' || byte == '\\'; }
bool IsLineEndByte(char byte) { return byte == '\n' || byte == '\r'; }

// The word's last bytes may lie at the end of memory: they are copied.
std::string WithSpare(Text word) {
  std::string copy(word);
  copy.append(8, '\0');
  return copy;
}

}  // namespace

WordKey KeyOfWord(Text word) { return KeyAt(WithSpare(word).data(), word.size()); }
WordKey KeyOfDefinition(Text name) { return DefinitionOf(KeyOfWord(name)); }
WordKey KeyOfMember(Text name) { return MemberOf(KeyOfWord(name)); }

bool HasWordKey(Text word) {
  return !word.empty() && !IsDigitByte(word[0]) && std::ranges::all_of(word, IsIdentifierByte);
}

// ---- the set of keys ----

void WordKeys::Clear(size_t size) {
  const size_t slots = std::bit_ceil(std::clamp<size_t>(size / 16, 256, 1 << 14));
  slots_.assign(slots, 0);
  slot_mask_ = slots - 1;
  keys_.clear();
  attributes_.clear();
}

void WordKeys::Grow() {
  slots_.assign(slots_.size() * 2, 0);
  slot_mask_ = slots_.size() - 1;
  for (const WordKey key : keys_) {
    size_t at = (key >> 20) & slot_mask_;
    while (slots_[at] != 0) at = (at + 1) & slot_mask_;
    slots_[at] = key;
  }
}

inline void WordKeys::Add(WordKey key) {
  for (size_t at = (key >> 20) & slot_mask_;; at = (at + 1) & slot_mask_) {
    if (slots_[at] == key) return;
    if (slots_[at] != 0) continue;
    slots_[at] = key;
    keys_.push_back(key);
    if (keys_.size() * 2 > slots_.size()) Grow();
    return;
  }
}

// ---- reading ----

void WordKeys::Read(std::string& source) {
  size_ = source.size();
  Clear(size_);
  budget_ = 2 * size_ + 4096;
  may_define_any_ = false;
  source.append(kSpare, '\0');
  text_ = source.data();
  ReadBlocks();
  text_ = nullptr;
  source.resize(size_);
}

void WordKeys::ReadBlocks() {
  size_t begin = 0;
  uint64_t is_inside = 0;
  // The block behind the last byte ends the last word.
  for (size_t base = 0; base <= size_; base += 64) {
    const BlockMasks masks = MasksOf(text_ + base);
    uint64_t edges = masks.names ^ (masks.names << 1 | is_inside);
    if (is_inside != 0 && edges != 0) {
      AddWord(begin, base + static_cast<size_t>(std::countr_zero(edges)));
      edges &= edges - 1;
    } else if (is_inside != 0) {
      continue;
    }
    is_inside = masks.names >> 63;
    while (edges != 0) {
      begin = base + static_cast<size_t>(std::countr_zero(edges));
      edges &= edges - 1;
      if (edges == 0) break;
      AddWord(begin, base + static_cast<size_t>(std::countr_zero(edges)));
      edges &= edges - 1;
    }
    for (uint64_t marks = masks.marks; marks != 0; marks &= marks - 1)
      ReadMark(base + static_cast<size_t>(std::countr_zero(marks)));
    if (base % kBytesBetweenCounts == 0) CountSteps(kStepsOfCount);
  }
}

inline void WordKeys::AddWord(size_t begin, size_t end) {
  const char* const at = text_ + begin;
  if (IsDigitByte(*at)) return;
  const size_t size = end - begin;
  Add(KeyAt(at, size));
  if (size > 5) return;
  const uint64_t word = TailOf(at, size);
  if (word != kDefWord && word != kClassWord && word != kAsWord && word != kForWord) return;
  if (word == kForWord) {
    ReadLoopTargets(begin, end);
  } else if (word == kAsWord) {
    ReadAlias(end);
  } else {
    ReadNameBehind(end);
  }
}

void WordKeys::AddDefinition(size_t begin, size_t end, bool is_annotated) {
  if (IsDigitByte(text_[begin])) return;
  const WordKey word = KeyAt(text_ + begin, end - begin);
  Add(DefinitionOf(word));
  if (IsBehindDot(begin) && (!is_annotated || BeginsStatement(begin))) attributes_.push_back(MemberOf(word));
}

bool WordKeys::IsBehindDot(size_t at) const {
  while (at > 0 && (IsBlankByte(text_[at - 1]) || IsLineEndByte(text_[at - 1]))) --at;
  return at > 0 && text_[at - 1] == '.';
}

// Whether a chain of names that ends there is the first of its statement.
bool WordKeys::BeginsStatement(size_t at) const {
  while (at > 0 && (text_[at - 1] == '.' || IsIdentifierByte(text_[at - 1]))) --at;
  while (at > 0 && IsBlankByte(text_[at - 1])) --at;
  return at == 0 || IsLineEndByte(text_[at - 1]) || text_[at - 1] == ';' || text_[at - 1] == ':';
}

size_t WordKeys::BeginOfWord(size_t end) const {
  while (end > 0 && IsIdentifierByte(text_[end - 1])) --end;
  return end;
}

size_t WordKeys::EndOfWord(size_t begin) const {
  while (IsIdentifierByte(text_[begin])) ++begin;
  return begin;
}

// Whether no backslash stands in front of an end of a line.
bool WordKeys::EndsStatement(size_t line_end) const {
  if (line_end > 0 && text_[line_end] == '\n' && text_[line_end - 1] == '\r') --line_end;
  return line_end == 0 || text_[line_end - 1] != '\\';
}

bool WordKeys::Spend(size_t bytes) {
  if (budget_ < bytes) may_define_any_ = true;
  budget_ -= std::min(bytes, budget_);
  return !may_define_any_;
}

// A `=` or `:`, which may be part of another operator.
void WordKeys::ReadMark(size_t at) {
  size_t end = at;  // of what stands in front
  bool is_list = text_[at] == '=';
  if (is_list) {
    if (text_[at + 1] == '=' || at == 0) return;
    const char before = text_[at - 1];
    switch (before) {
      case '=':
      case '!':
      case ':':
        return;
      case '<':
      case '>':
        if (at < 2 || text_[at - 2] != before) return;
        end = at - 2;
        is_list = false;
        break;
      case '+':
      case '-':
      case '*':
      case '/':
      case '%':
      case '&':
      case '|':
      case '^':
      case '@':
        end = at - 1;
        if (end > 0 && text_[end - 1] == before) --end;
        is_list = false;
        break;
      default:
        break;
    }
  }
  while (end > 0 && (IsBlankByte(text_[end - 1]) || IsLineEndByte(text_[end - 1]))) --end;
  const size_t begin = BeginOfWord(end);
  if (begin < end) AddDefinition(begin, end, text_[at] == ':');
  if (!is_list || end == 0) return;
  if (begin < end) {
    // Nearly all are a name or a chain of them at the beginning of a line, or the first argument of a call.
    size_t first = begin;
    while (first > 0 && (text_[first - 1] == '.' || IsIdentifierByte(text_[first - 1]))) --first;
    if (first > 0 && text_[first - 1] == '(') {
      if (first > 1 && IsIdentifierByte(text_[first - 2])) return;
    } else {
      while (first > 0 && (text_[first - 1] == ' ' || text_[first - 1] == '\t')) --first;
      if (first == 0 || (IsLineEndByte(text_[first - 1]) && EndsStatement(first - 1))) return;
    }
  } else if (text_[end - 1] != ')' && text_[end - 1] != ']' && text_[end - 1] != ',') {
    return;
  }
  ReadTargetsBefore(end);
}

void WordKeys::ReadTargetsBefore(size_t end) {
  targets_.clear();
  if (!FindTargetsBefore(end)) return;
  for (const auto& [begin, behind] : targets_) AddDefinition(begin, behind);
}

// Back from the `=` of an assignment to the beginning of the statement or to the `=` in front; false where it leads to
// the call whose argument it is. In brackets lines do not end.
bool WordKeys::FindTargetsBefore(size_t end) {
  size_t depth = 0;
  char next = '=';  // what follows, blanks left out
  for (size_t at = end; at > 0;) {
    const char byte = text_[at - 1];
    if (IsIdentifierByte(byte)) {
      const size_t begin = BeginOfWord(at);
      if (!Spend(at - begin)) return false;
      const bool is_type = next == '[' && begin >= 5 && std::memcmp(text_ + begin - 5, "type ", 5) == 0;
      if (next == '=' || next == ',' || next == ')' || next == ']' || is_type) targets_.emplace_back(begin, at);
      at = begin;
      next = byte;
      continue;
    }
    if (!Spend(1)) return false;
    --at;
    if (IsBlankByte(byte)) continue;
    if (IsLineEndByte(byte)) {
      if (depth == 0 && EndsStatement(at)) return true;
      continue;
    }
    next = byte;
    switch (byte) {
      case ';':
      case '=':
        if (depth == 0) return true;
        break;
      case ')':
      case ']':
      case '}':
        ++depth;
        break;
      case '{':
      case '(':
      case '[':
        if (depth > 0) {
          --depth;
        } else if (byte == '{' ||
                   (at > 0 && (IsIdentifierByte(text_[at - 1]) || text_[at - 1] == ')' || text_[at - 1] == ']'))) {
          return false;
        }
        break;
      case '"':
      case '\'': {
        // A key: brackets in it are none.
        size_t quote = at;
        while (quote > 0 && text_[quote - 1] != byte && !IsLineEndByte(text_[quote - 1])) --quote;
        if (!Spend(at - quote)) return false;
        if (quote > 0 && text_[quote - 1] == byte) at = quote - 1;
        break;
      }
      default:
        break;
    }
  }
  return true;
}

// Behind `def` and `class`.
void WordKeys::ReadNameBehind(size_t at) {
  while (IsBlankByte(text_[at]) || IsLineEndByte(text_[at])) ++at;
  if (const size_t end = EndOfWord(at); end > at) AddDefinition(at, end);
}

// Behind `as`: a name, a chain of them, or several in brackets.
void WordKeys::ReadAlias(size_t at) {
  while (IsBlankByte(text_[at]) || IsLineEndByte(text_[at])) ++at;
  size_t depth = 0;
  for (; Spend(1); ++at) {
    const char byte = text_[at];
    if (IsIdentifierByte(byte)) {
      const size_t end = EndOfWord(at);
      if (!Spend(end - at)) return;
      AddDefinition(at, end);
      at = end;
      if (depth == 0 && text_[at] != '.') return;
      --at;
    } else if (byte == '(' || byte == '[') {
      ++depth;
    } else if (byte == ')' || byte == ']') {
      if (depth <= 1) return;
      --depth;
    } else if (byte != '.' &&
               (depth == 0 || (!IsBlankByte(byte) && !IsLineEndByte(byte) && byte != ',' && byte != '*'))) {
      return;
    }
  }
}

// Behind a `for` that begins a statement, as those of comprehensions define no name that others see.
void WordKeys::ReadLoopTargets(size_t keyword, size_t at) {
  size_t before = keyword;
  while (before > 0 && IsBlankByte(text_[before - 1])) --before;
  if (before > 0 && !IsLineEndByte(text_[before - 1]) && text_[before - 1] != ':' && text_[before - 1] != ';' &&
      (before < 5 || std::memcmp(text_ + before - 5, "async", 5) != 0))
    return;
  size_t depth = 0;
  for (; at < size_ && Spend(1); ++at) {
    const char byte = text_[at];
    if (IsIdentifierByte(byte)) {
      const size_t end = EndOfWord(at);
      if (!Spend(end - at)) return;
      if (end - at == 2 && std::memcmp(text_ + at, "in", 2) == 0) return;
      AddDefinition(at, end);
      at = end - 1;
    } else if (byte == '(' || byte == '[') {
      ++depth;
    } else if (byte == ')' || byte == ']') {
      if (depth > 0) --depth;
    } else if (byte == ':' || byte == '=') {
      return;
    } else if (IsLineEndByte(byte) && depth == 0 && text_[at - 1] != '\\' && text_[at - 1] != '\r') {
      return;
    }
  }
}

// ---- filters ----

namespace {

// The bit of a probe, of so many.
size_t BitOf(WordKey key, int probe, size_t count) {
  const uint32_t number = static_cast<uint32_t>(key >> 32) + static_cast<uint32_t>(probe) * static_cast<uint32_t>(key);
  return static_cast<size_t>((uint64_t{number} * count) >> 32);
}

}  // namespace

void AppendFilter(const std::vector<WordKey>& keys, std::vector<uint64_t>& bits) {
  const size_t begin = bits.size();
  const size_t size = (keys.size() * kBitsOfAKey + 63) / 64;
  bits.resize(begin + size);
  for (const WordKey key : keys) {
    for (int probe = 0; probe < kProbes; ++probe) {
      const size_t bit = BitOf(key, probe, size * 64);
      bits[begin + bit / 64] |= uint64_t{1} << (bit % 64);
    }
  }
}

bool MayHold(const uint64_t* bits, size_t size, WordKey key) {
  if (size == 0) return false;
  for (int probe = 0; probe < kProbes; ++probe) {
    const size_t bit = BitOf(key, probe, size * 64);
    if ((bits[bit / 64] >> (bit % 64) & 1) == 0) return false;
  }
  return true;
}

}  // namespace quillet
