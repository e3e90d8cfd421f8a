// Keys, the statements that are made up for them, their plans, and the table that has a plan for each frequent
// shape.
#include "analysis/statement_shapes.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstring>
#include <utility>

#include "foundations/stop.h"
#include "text/node_to_text.h"
#include "tokens/token_ends.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

// Longer statements are rarely like an earlier one.
constexpr size_t kMaxTokens = 32;
// What a copy of a short text reads and writes, whatever its size.
constexpr size_t kCopySlack = TextArena::kSlack;
// Of the texts that are part of a key.
constexpr size_t kMaxOwnTexts = 64;
// A plan costs as much as some analyses: it stays for a while, and goes when others are met more often.
constexpr uint32_t kFirstUses = 32;
constexpr uint32_t kMostUses = 200;
// How many statements without a plan it takes until those of long ago count half.
constexpr size_t kMissesOfAnAge = size_t{1} << 17;

// How far a token stands from the one in front of it.
enum Gap : uint8_t { kTouches, kOneBlank, kApart };

constexpr Text kGapTexts[] = {"", " ", "  "};

// What a token is to its shape: its code, or one of these where that does not say it.
enum What : uint8_t {
  kNever = 0x5F,   // no shape has it
  kOwnText,        // its very text counts
  kDigits,         // a number of digits alone
  kShownString,    // a string whose contents are shown wherever strings are
  kUnshownString,  // any other
  kShownPrefixed,  // the same behind a prefix, which counts itself
  kUnshownPrefixed,
};

constexpr bool IsUnshown(uint8_t what) { return what == kUnshownString || what == kUnshownPrefixed; }

// Codes that do not say all that counts.
constexpr std::array<bool, 256> kNeedsLook = [] {
  std::array<bool, 256> table{};
  for (const TokenCode code : {tok::NAME, tok::NUMBER, tok::STRING, tok::NOTEQUAL, tok::ATEQUAL, tok::ERRORTOKEN,
                               tok::BACKSLASH, tok::REMOVED})
    table[code] = true;
  return table;
}();

// The first `length` bytes of eight.
constexpr std::array<uint64_t, 9> kFrontMasks = [] {
  std::array<uint64_t, 9> masks{};
  for (size_t length = 1; length <= 8; ++length) masks[length] = ~uint64_t{0} >> (64 - 8 * length);
  return masks;
}();

constexpr uint64_t kMultiplier = 0x9E3779B97F4A7C15u;

uint64_t Load64(const void* at) {
  uint64_t value;
  std::memcpy(&value, at, sizeof value);
  return value;
}

// The name that a walker knows by its text.
bool IsKnownName(Text name) { return name == "isinstance"; }
constexpr auto kFrontOfKnownName = std::bit_cast<uint64_t>(std::array{'i', 's', 'i', 'n', 's', 't', 'a', 'n'});

// That reads as such in every version.
bool IsAllDigits(Text text) {
  return (text.size() == 1 || text[0] != '0') && std::all_of(text.begin(), text.end(), IsAsciiDigit);
}

size_t PrefixLengthOf(const Token& string) {
  size_t length = 0;
  while (!IsQuote(string.text[length])) ++length;
  return length;
}

}  // namespace

// ---- keys ----

// What a statement has in common with others of its shape, as bytes: its kind and place, then two bytes a token
// (what it is; its gap and the first token that it equals), then the texts that count themselves. It is hashed while
// it is put together, since words are slow to read where single bytes were just written.
class StatementShapes::Key {
 public:
  // False for a statement that has no shape.
  bool Make(const LogicalLine& line, bool in_async_def) {
    toks_ = line.toks.data();
    count_ = line.toks.size();
    bytes_[0] = static_cast<uint8_t>(line.kind);
    bytes_[1] = in_async_def;
    uint64_t hash = count_ << 16 | static_cast<uint64_t>(line.kind) << 8 | in_async_def;
    const char* end = toks_[0].text;
    size_t text_size = 0;
    size_t look_count = 0;
    uint8_t looks[kMaxTokens];
    for (size_t i = 0; i < count_; ++i) {
      const Token& token = toks_[i];
      const bool touches = token.text == end;
      const bool is_one_blank_apart = token.text == end + 1 && *end == ' ';
      const auto gap = static_cast<uint8_t>(touches ? kTouches : is_one_blank_apart ? kOneBlank : kApart);
      bytes_[kHead + 2 * i] = token.code;
      bytes_[kHead + 2 * i + 1] = static_cast<uint8_t>(gap << kGapShift);
      hash = Mixed(hash, uint64_t{token.code} << 8 | gap);
      looks[look_count] = static_cast<uint8_t>(i);
      look_count += kNeedsLook[token.code];
      text_size += token.length;
      end = token.end();
    }
    size_ = kHead + 2 * count_;
    text_size_ = text_size;
    uint64_t look_hash = 0;
    Known known;
    for (size_t k = 0; k < look_count; ++k) {
      const uint8_t i = looks[k];
      const Token& token = toks_[i];
      const uint64_t front = Load64(token.text) & kFrontMasks[std::min<size_t>(token.length, 8)];
      uint8_t what = token.code;
      if (what != tok::NAME || front == kFrontOfKnownName) {
        what = WhatIs(token);
        if (what == kNever) return false;
        bytes_[kHead + 2 * i] = what;
      }
      const uint8_t first = FirstEqual(i, front, known);
      bytes_[kHead + 2 * i + 1] |= first;
      look_hash = Mixed(look_hash, uint64_t{what} << 8 | first);
    }
    std::memset(bytes_.data() + size_, 0, sizeof(uint64_t));
    hash_ ^= hash + (look_hash << 32 | look_hash >> 32);
    hash_ = Mixed(hash_ ^ hash_ >> 32, 0);
    return true;
  }

  // The size in words, the last of which may end in zeros.
  static size_t WordsOf(size_t size) { return (size + sizeof(uint64_t) - 1) / sizeof(uint64_t); }
  bool Equals(const uint8_t* bytes, size_t size) const {
    if (size != size_) return false;
    uint64_t difference = 0;
    for (size_t i = 0; i < WordsOf(size); ++i)
      difference |= Load64(bytes_.data() + sizeof(uint64_t) * i) ^ Load64(bytes + sizeof(uint64_t) * i);
    return difference == 0;
  }

  uint64_t hash() const { return hash_; }
  const uint8_t* bytes() const { return bytes_.data(); }
  size_t size() const { return size_; }
  size_t count() const { return count_; }
  const Token& token(size_t i) const { return toks_[i]; }
  uint8_t what(size_t i) const { return bytes_[kHead + 2 * i]; }
  Gap gap(size_t i) const { return static_cast<Gap>(bytes_[kHead + 2 * i + 1] >> kGapShift); }
  size_t first_equal(size_t i) const { return bytes_[kHead + 2 * i + 1] & ((1 << kGapShift) - 1); }
  // No text that the statement's tokens are joined to is longer.
  size_t MostJoined() const { return text_size_ + count_ + 2; }

 private:
  static constexpr size_t kHead = 2;
  static constexpr unsigned kGapShift = 6;

  static uint64_t Mixed(uint64_t hash, uint64_t value) { return (hash ^ value) * kMultiplier; }

  // The tokens that equal none in front of them.
  struct Known {
    uint64_t seen = 0;  // a bit for the front of each
    size_t count = 0;
    std::array<uint64_t, kMaxTokens> fronts;
    std::array<uint8_t, kMaxTokens> tokens;
  };

  // What a token is whose code does not say all that counts.
  uint8_t WhatIs(const Token& token) {
    switch (token.code) {
      case tok::NAME:
        return IsKnownName(token.view()) ? WithOwnText(token.view()) : uint8_t{tok::NAME};
      case tok::NUMBER:
        return IsAllDigits(token.view()) ? uint8_t{kDigits} : WithOwnText(token.view());
      case tok::STRING:
        return WhatString(token);
      case tok::NOTEQUAL:
      case tok::ATEQUAL:
        return WithOwnText(token.view());
      default:
        return kNever;
    }
  }

  uint8_t WhatString(const Token& token) {
    const size_t prefix_length = PrefixLengthOf(token);
    // An empty one reads like one whose contents are not shown.
    if (token.length == prefix_length + 2) return WithOwnText(token.view());
    const bool is_shown = CNodeToTextConverter::ShowsContentsOf(token.view());
    if (prefix_length == 0) return is_shown ? kShownString : kUnshownString;
    if (WithOwnText({token.text, prefix_length}) == kNever) return kNever;
    return is_shown ? kShownPrefixed : kUnshownPrefixed;
  }

  uint8_t WithOwnText(Text text) {
    if (size_ + 1 + text.size() > kMostBytes) return kNever;
    bytes_[size_++] = static_cast<uint8_t>(text.size());
    std::memcpy(bytes_.data() + size_, text.data(), text.size());
    size_ += text.size();
    for (const char c : text) hash_ = Mixed(hash_, static_cast<unsigned char>(c));
    return kOwnText;
  }

  // The first token of this text, which begins with `front`, among those that are looked at.
  uint8_t FirstEqual(uint8_t i, uint64_t front, Known& known) const {
    const Token& token = toks_[i];
    const uint64_t bit = uint64_t{1} << (front * kMultiplier >> 58);
    if ((known.seen & bit) != 0) {
      for (size_t k = 0; k < known.count; ++k) {
        if (known.fronts[k] != front) continue;
        const Token& other = toks_[known.tokens[k]];
        if (other.length == token.length &&
            (token.length <= 8 || std::memcmp(other.text + 8, token.text + 8, token.length - 8) == 0))
          return known.tokens[k];
      }
    }
    known.seen |= bit;
    known.fronts[known.count] = front;
    known.tokens[known.count++] = i;
    return i;
  }

  static constexpr size_t kMostBytes = kHead + 2 * kMaxTokens + kMaxOwnTexts;

  const Token* toks_ = nullptr;
  size_t count_ = 0;
  size_t size_ = 0;
  size_t text_size_ = 0;
  uint64_t hash_ = 0;
  std::array<uint8_t, kMostBytes + sizeof(uint64_t)> bytes_;
};

// ---- statements that are made up ----

// A statement of a shape, in which each name, number and string holds a mark: two bytes that stand nowhere else,
// and read as a letter.
class StatementShapes::MadeUp {
 public:
  explicit MadeUp(const Key& key) : key_(key), source_(SourceText::Copy(Text(""))) {
    std::string text;
    std::vector<Token> tokens;
    for (size_t i = 0; i < key.count(); ++i) {
      text += kGapTexts[key.gap(i)];
      const size_t begin = text.size();
      AppendToken(i, text);
      tokens.push_back({nullptr, static_cast<uint32_t>(text.size() - begin), key.token(i).code});
      begins_.push_back(begin);
    }
    source_->Assign(text);
    source_->line_starts = {0};
    for (size_t i = 0; i < tokens.size(); ++i) tokens[i].text = source_->begin() + begins_[i];
    source_->tokens = std::move(tokens);
  }

  const Ref<SourceText>& source() const { return source_; }
  TokenSpan toks() const { return source_->tokens; }
  const Key& key() const { return key_; }
  size_t MostJoined() const { return source_->size() + key_.count() + 2; }

  static constexpr char kMark = '\xC4';
  static std::string MarkOf(size_t i) { return {kMark, static_cast<char>(kFirstMark + i)}; }
  // The token that the mark at `at` stands for; a number of no token where there is none.
  static size_t TokenOfMark(Text text, size_t at) {
    if (text[at] != kMark || at + 1 == text.size()) return kMaxTokens;
    return static_cast<uint8_t>(text[at + 1]) - size_t{kFirstMark};
  }

 private:
  static constexpr uint8_t kFirstMark = 0x80;
  static_assert(kMaxTokens <= 0x40, "the second byte of a mark is one that goes on a character");

  void AppendToken(size_t i, std::string& text) const {
    const Token& token = key_.token(i);
    const std::string mark = MarkOf(key_.first_equal(i));
    const uint8_t what = key_.what(i);
    switch (what) {
      case tok::NAME:
        text += mark;
        break;
      case kDigits:
        text.append("1").append(mark);
        break;
      case kShownPrefixed:
      case kUnshownPrefixed:
        text.append(token.text, PrefixLengthOf(token));
        [[fallthrough]];
      case kShownString:
      case kUnshownString:
        // What is no letter keeps a string from being shown.
        text.append("'").append(mark).append(IsUnshown(what) ? "$'" : "'");
        break;
      case tok::COMMENT:
        text += "#";
        break;
      default:
        text += token.view();
        break;
    }
  }

  const Key& key_;
  Ref<SourceText> source_;
  std::vector<size_t> begins_;
};

// ---- plans ----

// The records of a shape, packed: a few hundred bytes are read for each statement that is told.
class StatementShapes::Plan {
 public:
  // Where a text comes from.
  enum Origin : uint8_t {
    kFixed,     // it is the one of this number in kFixedTexts
    kTokens,    // it is what stands in the source from one token to another
    kComposed,  // it is composed of pieces
    kEncoded,   // the same, with strings that may have to be spelt otherwise
  };
  struct TextPlan {
    Origin origin;
    uint8_t first;  // token, or piece; or the number
    uint8_t last;   // token; or how many pieces
    uint8_t fixed;  // where the fixed texts of the pieces begin
  };
  struct RecordPlan {
    TextPlan name, info;
  };
  // A fixed text, and the token whose text follows it.
  struct Piece {
    static constexpr uint8_t kNoToken = 0xFF;
    static constexpr uint8_t kIsEncoded = 0x80;

    uint8_t fixed_size;
    uint8_t token;  // with kIsEncoded for a string that is spelt otherwise; or kNoToken
  };
  // Each of these is counted in a byte.
  struct Parts {
    std::vector<RecordPlan> records;
    size_t row_count = 0;  // of the records; the others are those of parameters
    std::vector<Piece> pieces;
    std::string fixed;
    bool is_bounded = false;
  };

  Plan() = default;
  // That of a shape which has to be analysed each time.
  explicit Plan(const Key& key) : Plan(key, Parts(), false) {}
  Plan(const Key& key, const Parts& parts) : Plan(key, parts, true) {}

  bool IsFor(const Key& key) const { return key.Equals(bytes_.get() + sizeof(Head), head().key_size); }
  bool is_whole() const { return head().is_whole; }
  // Whether the statement holds operator expressions, whose text may be too long.
  bool is_bounded() const { return head().is_bounded; }

  // Appends the records of a statement of the shape.
  void Tell(LogicalLine& line, std::string& scratch) const {
    const Head counts = head();
    const uint8_t* const records = bytes_.get() + RecordsBegin(counts);
    const uint8_t* const pieces = records + sizeof(RecordPlan) * counts.record_count;
    const Composer composer{line, pieces, pieces + sizeof(Piece) * counts.piece_count, scratch};
    line.DirectAppendRows(counts.row_count, [&](size_t i) { return composer.Make(records + sizeof(RecordPlan) * i); });
    for (size_t i = counts.row_count; i < counts.record_count; ++i) {
      const Record record = composer.Make(records + sizeof(RecordPlan) * i);
      line.DirectAppendArg(record.name(), record.info());
    }
  }

  // Texts that are there as long as the program. The first stands for none.
  static constexpr Text kFixedTexts[] = {
      kNoText,
      "",
      kSetPrefix,
      kGetPrefix,
      kGlobalPrefix,
      kNonlocalPrefix,
      "return",
      "yield",
      "*",
      kListInstanceName,
      kDictInstanceName,
      kTupleInstanceName,
      kSetInstanceName,
      kStringInstanceName,
      kUnicodeInstanceName,
      kBytesInstanceName,
      ":l:None: None",
      ":l:bool: True",
      ":l:bool: False",
  };

 private:
  struct Head {
    uint8_t key_size = 0;
    uint8_t row_count = 0;
    uint8_t record_count = 0;
    uint8_t piece_count = 0;
    uint8_t is_whole = false;
    uint8_t is_bounded = false;
    uint8_t unused[2] = {};
  };
  static_assert(sizeof(Head) == 8);

  Plan(const Key& key, const Parts& parts, bool is_whole) {
    Head head;
    head.key_size = static_cast<uint8_t>(key.size());
    head.row_count = static_cast<uint8_t>(parts.row_count);
    head.record_count = static_cast<uint8_t>(parts.records.size());
    head.piece_count = static_cast<uint8_t>(parts.pieces.size());
    head.is_whole = is_whole;
    head.is_bounded = parts.is_bounded;
    const size_t records_begin = RecordsBegin(head);
    const size_t records_size = sizeof(RecordPlan) * parts.records.size();
    const size_t pieces_size = sizeof(Piece) * parts.pieces.size();
    bytes_.reset(new uint8_t[records_begin + records_size + pieces_size + parts.fixed.size() + kCopySlack]);
    uint8_t* at = bytes_.get();
    const auto append = [&at](const void* from, size_t size) {
      if (size != 0) std::memcpy(at, from, size);
      at += size;
    };
    append(&head, sizeof head);
    append(key.bytes(), records_begin - sizeof head);
    append(parts.records.data(), records_size);
    append(parts.pieces.data(), pieces_size);
    append(parts.fixed.data(), parts.fixed.size());
  }

  Head head() const {
    Head head;
    std::memcpy(&head, bytes_.get(), sizeof head);
    return head;
  }
  static size_t RecordsBegin(const Head& head) { return sizeof head + sizeof(uint64_t) * Key::WordsOf(head.key_size); }

  // Makes the records of a statement.
  struct Composer {
    LogicalLine& line;
    const uint8_t* pieces;
    const uint8_t* fixed_texts;
    std::string& scratch;

    Record Make(const uint8_t* record) const {
      RecordPlan plan;
      std::memcpy(&plan, record, sizeof plan);
      const Text name = Make(plan.name);
      const Text info = Make(plan.info);
      return {name.data(), info.data(), static_cast<uint32_t>(name.size()), static_cast<uint32_t>(info.size())};
    }

    Text Make(const TextPlan& plan) const {
      switch (plan.origin) {
        case kFixed:
          return kFixedTexts[plan.first];
        case kTokens: {
          const char* const begin = line.toks[plan.first].text;
          return {begin, static_cast<size_t>(line.toks[plan.last].end() - begin)};
        }
        case kComposed:
          return Compose(plan);
        case kEncoded:
          break;
      }
      return Encode(plan);
    }

    Text Compose(const TextPlan& plan) const {
      const uint8_t* const first = pieces + sizeof(Piece) * plan.first;
      const uint8_t* const end = first + sizeof(Piece) * plan.last;
      size_t size = 0;
      for (const uint8_t* piece = first; piece < end; piece += sizeof(Piece)) {
        size += piece[0];
        if (piece[1] != Piece::kNoToken) size += line.toks[piece[1]].length;
      }
      char* const text = line.texts().AllocateWithSlack(size);
      char* at = text;
      const auto append = [&at](const char* from, size_t count) {
        // Most are short, and both sides may be read and written some bytes further.
        std::memcpy(at, from, kCopySlack);
        if (count > kCopySlack) [[unlikely]]
          std::memcpy(at + kCopySlack, from + kCopySlack, count - kCopySlack);
        at += count;
      };
      const char* fixed = reinterpret_cast<const char*>(fixed_texts) + plan.fixed;
      for (const uint8_t* piece = first; piece < end; piece += sizeof(Piece)) {
        append(fixed, piece[0]);
        fixed += piece[0];
        if (piece[1] == Piece::kNoToken) continue;
        const Token& token = line.toks[piece[1]];
        append(token.text, token.length);
      }
      return {text, size};
    }

    [[gnu::noinline]] Text Encode(const TextPlan& plan) const {
      const uint8_t* const first = pieces + sizeof(Piece) * plan.first;
      const char* fixed = reinterpret_cast<const char*>(fixed_texts) + plan.fixed;
      scratch.clear();
      for (size_t i = 0; i < plan.last; ++i) {
        scratch.append(fixed, first[2 * i]);
        fixed += first[2 * i];
        const uint8_t token = first[2 * i + 1];
        if (token == Piece::kNoToken) continue;
        if ((token & Piece::kIsEncoded) != 0)
          AppendEncodedStringLiteral(line.toks[token & ~Piece::kIsEncoded].view(), scratch);
        else
          scratch.append(line.toks[token].view());
      }
      return line.texts().Copy(scratch);
    }
  };

  // The head, the key, the records, the pieces, and the fixed texts that these refer to, in one piece: most of it
  // is read for each statement.
  std::unique_ptr<uint8_t[]> bytes_;
};

// Reads a plan off the records of a statement that was made up.
class StatementShapes::PlanReader {
 public:
  explicit PlanReader(const MadeUp& statement) : statement_(statement), key_(statement.key()) {}

  // False where it cannot be told how a text came about.
  bool Read(const LogicalLine& line) {
    for (const auto rows : {line.type_equivs(), line.arg_type_equivs()}) {
      for (const Record& record : rows) {
        Plan::RecordPlan plan;
        if (!ReadText(record.name(), plan.name) || !ReadText(record.info(), plan.info)) return false;
        parts_.records.push_back(plan);
      }
    }
    parts_.row_count = line.type_equivs().size();
    return parts_.records.size() <= kMost && parts_.pieces.size() <= kMost && parts_.fixed.size() <= kMost;
  }

  Plan::Parts& parts() { return parts_; }

 private:
  static constexpr size_t kMost = UINT8_MAX;

  bool ReadText(Text text, Plan::TextPlan& plan) {
    plan = {Plan::kFixed, 0, 0, 0};
    if (IsNone(text)) return true;
    if (!text.empty() && statement_.source()->Holds(text.data())) return ReadView(text, plan);
    for (size_t i = 1; i < std::size(Plan::kFixedTexts); ++i) {
      if (Plan::kFixedTexts[i] != text) continue;
      plan.first = static_cast<uint8_t>(i);
      return true;
    }
    return ReadComposed(text, plan);
  }

  bool ReadView(Text text, Plan::TextPlan& plan) const {
    const TokenSpan toks = statement_.toks();
    size_t first = 0;
    while (first < toks.size() && toks[first].text != text.data()) ++first;
    size_t last = first;
    while (last < toks.size() && toks[last].end() != text.data() + text.size()) ++last;
    if (last >= toks.size()) return false;
    for (size_t i = first; i <= last; ++i) {
      if ((i > first && key_.gap(i) == kApart) || IsUnshown(key_.what(i)) || key_.what(i) == tok::COMMENT) return false;
    }
    plan = {Plan::kTokens, static_cast<uint8_t>(first), static_cast<uint8_t>(last), 0};
    return true;
  }

  bool ReadComposed(Text text, Plan::TextPlan& plan) {
    const size_t first_piece = parts_.pieces.size();
    const size_t fixed_begin = parts_.fixed.size();
    if (first_piece > kMost || fixed_begin > kMost) return false;
    plan.origin = Plan::kComposed;
    size_t done = 0;
    for (size_t at = 0; at < text.size(); ++at) {
      if (text[at] != MadeUp::kMark) continue;
      const size_t token = MadeUp::TokenOfMark(text, at);
      if (token >= key_.count()) return false;
      // The mark stands for its token only where all of that is there.
      const Text whole = statement_.toks()[token].view();
      const size_t in_front = whole.find(MadeUp::MarkOf(token));
      if (at < done + in_front || text.substr(at - in_front, whole.size()) != whole) return false;
      const bool is_encoded = IsUnshown(key_.what(token));
      if (is_encoded) plan.origin = Plan::kEncoded;
      if (!AddPiece(text.substr(done, at - in_front - done),
                    static_cast<uint8_t>(token | (is_encoded ? Plan::Piece::kIsEncoded : 0))))
        return false;
      done = at - in_front + whole.size();
      at = done - 1;
    }
    if (done < text.size() && !AddPiece(text.substr(done), Plan::Piece::kNoToken)) return false;
    plan.first = static_cast<uint8_t>(first_piece);
    plan.last = static_cast<uint8_t>(parts_.pieces.size() - first_piece);
    plan.fixed = static_cast<uint8_t>(fixed_begin);
    return parts_.pieces.size() - first_piece <= kMost;
  }

  bool AddPiece(Text fixed, uint8_t token) {
    if (fixed.size() > kMost) return false;
    parts_.pieces.push_back({static_cast<uint8_t>(fixed.size()), token});
    parts_.fixed += fixed;
    return true;
  }

  const MadeUp& statement_;
  const Key& key_;
  Plan::Parts parts_;
};

// ---- the table ----

// The shapes whose hashes lead to the same place, in one line of the cache.
struct alignas(64) StatementShapes::Set {
  static constexpr size_t kWays = 4;

  std::array<uint32_t, kWays> tags{};  // of the hashes
  std::array<uint32_t, kWays> uses{};  // of late: a plan that is used stays
  std::array<Plan, kWays> plans;

  // The first of the tag, or kWays.
  size_t Find(uint32_t tag) const {
    unsigned found = 1u << kWays;
    for (size_t way = 0; way < kWays; ++way) found |= static_cast<unsigned>(tags[way] == tag) << way;
    return static_cast<size_t>(std::countr_zero(found));
  }
  size_t LeastUsed() const { return static_cast<size_t>(std::min_element(uses.begin(), uses.end()) - uses.begin()); }
};

StatementShapes::StatementShapes(CPGenAnalyzerImpl& analyzer, uint8_t frequent)
    : analyzer_(analyzer), frequent_(frequent), is_able_(frequent != 0 && analyzer.HasNoKeywordsOfItsOwn()) {}

StatementShapes::~StatementShapes() = default;

bool StatementShapes::Tell(LogicalLine& line, const LinePlace& place, const TypingNames& typing) {
  if (!is_able_ || is_learning_ || !line.no_embedded || line.toks.size() > kMaxTokens || typing.has_renamed_cast())
    return false;
  if (line.kind == LineKind::kComment) return true;  // without a hint
  Key key;
  if (!key.Make(line, place.in_async_def)) return false;
  if (sets_.empty()) [[unlikely]] {
    sets_.resize(kSets);
    counters_.resize(kCounters);
  }
  // 0 is that of no plan.
  const uint32_t tag = static_cast<uint32_t>(key.hash()) | 1;
  Set& set = sets_[key.hash() >> 32 & (kSets - 1)];
  size_t way = set.Find(tag);
  if (way == Set::kWays) {
    if (!IsFrequent(key.hash())) return false;
    way = set.LeastUsed();
    if (set.uses[way] > 0) {
      --set.uses[way];
      return false;
    }
    set.plans[way] = Learn(key, line, place.in_async_def);
    set.tags[way] = tag;
    set.uses[way] = kFirstUses;
  } else if (!set.plans[way].IsFor(key)) [[unlikely]] {
    return false;
  }
  set.uses[way] += set.uses[way] < kMostUses;
  const Plan& plan = set.plans[way];
  if (!plan.is_whole() || (plan.is_bounded() && key.MostJoined() > CNodeWalker::kMaxOperatorText)) return false;
  plan.Tell(line, scratch_);
  // Comes last: a host that is asked whether to stop may have other lines analysed, and plans replaced.
  CountSteps(static_cast<int64_t>(line.toks.size()));
  return true;
}

std::optional<SyntaxError> StatementShapes::AnalyzeSingleLogical(LogicalLine& line, bool in_async_def,
                                                                 bool first_in_def) {
  const bool is_as_cut = line.hooks == nullptr && !line.has_stored_positions() && !line.toks.empty() &&
                         line.toks.size() == static_cast<size_t>(line.token_count);
  if (is_as_cut && !line.parsed) {
    static const TypingNames no_names;
    line.parsed = true;
    line.ClearDerivedInfo();
    try {
      if (Tell(line, {in_async_def, first_in_def}, no_names)) return std::nullopt;
      line.parsed = false;
    } catch (...) {
      // As if it had not begun.
      line.ClearDerivedInfo();
      line.parsed = false;
      throw;
    }
  }
  return analyzer_.AnalyzeSingleLogical(line, in_async_def, first_in_def);
}

bool StatementShapes::IsFrequent(uint64_t hash) {
  if (++misses_ == kMissesOfAnAge) {
    misses_ = 0;
    for (uint8_t& counter : counters_) counter /= 2;
  }
  uint8_t& counter = counters_[hash >> 32 & (kCounters - 1)];
  if (counter < frequent_) ++counter;
  return counter == frequent_;
}

StatementShapes::Plan StatementShapes::Learn(const Key& key, const LogicalLine& line, bool in_async_def) {
  struct Learning {
    bool& is_on;
    ~Learning() { is_on = false; }
  };
  is_learning_ = true;
  const Learning learning{is_learning_};
  const MadeUp statement(key);
  made_up_records_.Reset();
  LogicalLine made_up;
  made_up.source = statement.source().get();
  made_up.toks = statement.toks();
  made_up.kind = line.kind;
  made_up.no_embedded = true;
  made_up.token_count = line.token_count;
  made_up.WriteTo(&made_up_records_);
  if (!analyzer_.WalkWithoutDoubt(made_up, in_async_def)) return Plan(key);
  const bool is_bounded = analyzer_.node_walker().met_operator_text();
  if (is_bounded && statement.MostJoined() > CNodeWalker::kMaxOperatorText) return Plan(key);
  PlanReader reader(statement);
  if (!reader.Read(made_up)) return Plan(key);
  reader.parts().is_bounded = is_bounded;
  return Plan(key, reader.parts());
}

}  // namespace quillet
