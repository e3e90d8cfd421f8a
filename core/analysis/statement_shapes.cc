// Keys, the statements that are made up for them, their plans, and the table that has a plan for each frequent
// shape.
#include "analysis/statement_shapes.h"

#include <algorithm>
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
// (what it is; its gap and the first token that it equals), then the texts that count themselves.
class StatementShapes::Key {
 public:
  // False for a statement that has no shape.
  bool Make(const LogicalLine& line, bool in_async_def) {
    toks_ = line.toks.data();
    count_ = line.toks.size();
    bytes_[0] = static_cast<uint8_t>(line.kind);
    bytes_[1] = in_async_def;
    const char* end = toks_[0].text;
    size_t look_count = 0;
    uint8_t looks[kMaxTokens];
    for (size_t i = 0; i < count_; ++i) {
      const Token& token = toks_[i];
      const bool touches = token.text == end;
      const bool is_one_blank_apart = token.text == end + 1 && *end == ' ';
      const auto gap = static_cast<uint8_t>(touches ? kTouches : is_one_blank_apart ? kOneBlank : kApart);
      bytes_[kHead + 2 * i] = token.code;
      bytes_[kHead + 2 * i + 1] = static_cast<uint8_t>(gap << kGapShift);
      looks[look_count] = static_cast<uint8_t>(i);
      look_count += kNeedsLook[token.code];
      text_size_ += token.length;
      end = token.end();
    }
    size_ = kHead + 2 * count_;
    for (size_t k = 0; k < look_count; ++k) {
      if (!Look(looks[k])) return false;
    }
    return true;
  }

  uint64_t Hash() {
    std::memset(bytes_.data() + size_, 0, sizeof(uint64_t));
    uint64_t hash = size_;
    for (size_t at = 0; at < size_; at += sizeof(uint64_t)) {
      hash = (hash ^ Load64(bytes_.data() + at)) * kMultiplier;
      hash ^= hash >> 29;
    }
    return hash * kMultiplier;
  }

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

  // Says more of the token; false where no shape has it.
  bool Look(uint8_t i) {
    const Token& token = toks_[i];
    uint8_t& what = bytes_[kHead + 2 * i];
    switch (token.code) {
      case tok::NAME:
        bytes_[kHead + 2 * i + 1] |= FirstEqual(i);
        if (token.length == 10 && IsKnownName(token.view())) [[unlikely]]
          what = WithOwnText(token.view());
        break;
      case tok::NUMBER:
        bytes_[kHead + 2 * i + 1] |= FirstEqual(i);
        what = IsAllDigits(token.view()) ? uint8_t{kDigits} : WithOwnText(token.view());
        break;
      case tok::STRING:
        bytes_[kHead + 2 * i + 1] |= FirstEqual(i);
        what = WhatString(token);
        break;
      case tok::NOTEQUAL:
      case tok::ATEQUAL:
        what = WithOwnText(token.view());
        break;
      default:
        what = kNever;
        break;
    }
    return what != kNever;
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
    return kOwnText;
  }

  // The first token of this text among the names, numbers and strings.
  uint8_t FirstEqual(uint8_t i) {
    const Token& token = toks_[i];
    const uint64_t front = Load64(token.text) & kFrontMasks[std::min<size_t>(token.length, 8)];
    const uint64_t bit = uint64_t{1} << (front * kMultiplier >> 58);
    if ((seen_ & bit) != 0) {
      for (size_t known = 0; known < known_count_; ++known) {
        if (known_fronts_[known] != front) continue;
        const Token& other = toks_[known_[known]];
        if (other.length == token.length &&
            (token.length <= 8 || std::memcmp(other.text + 8, token.text + 8, token.length - 8) == 0))
          return known_[known];
      }
    }
    seen_ |= bit;
    known_fronts_[known_count_] = front;
    known_[known_count_++] = i;
    return i;
  }

  static constexpr size_t kMostBytes = kHead + 2 * kMaxTokens + kMaxOwnTexts;

  const Token* toks_ = nullptr;
  size_t count_ = 0;
  size_t size_ = 0;
  size_t text_size_ = 0;
  // The tokens that equal none in front of them.
  uint64_t seen_ = 0;  // a bit for the front of each
  size_t known_count_ = 0;
  std::array<uint64_t, kMaxTokens> known_fronts_;
  std::array<uint8_t, kMaxTokens> known_;
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

  // That of a shape which has to be analysed each time.
  explicit Plan(const Key& key) : Plan(key, Parts()) { is_whole_ = false; }

  Plan(const Key& key, const Parts& parts)
      : is_bounded_(parts.is_bounded),
        key_size_(static_cast<uint8_t>(key.size())),
        row_count_(static_cast<uint8_t>(parts.row_count)),
        record_count_(static_cast<uint8_t>(parts.records.size())),
        piece_count_(static_cast<uint8_t>(parts.pieces.size())),
        bytes_(new uint8_t[FixedBegin() + parts.fixed.size() + kSlack]) {
    std::copy_n(key.bytes(), key.size(), bytes_.get());
    std::copy_n(reinterpret_cast<const uint8_t*>(parts.records.data()), sizeof(RecordPlan) * record_count_,
                bytes_.get() + RecordsBegin());
    std::copy_n(reinterpret_cast<const uint8_t*>(parts.pieces.data()), sizeof(Piece) * piece_count_,
                bytes_.get() + PiecesBegin());
    std::copy_n(parts.fixed.data(), parts.fixed.size(), bytes_.get() + FixedBegin());
  }

  bool IsFor(const Key& key) const {
    return key.size() == key_size_ && std::memcmp(key.bytes(), bytes_.get(), key_size_) == 0;
  }
  bool is_whole() const { return is_whole_; }
  // Whether the statement holds operator expressions, whose text may be too long.
  bool is_bounded() const { return is_bounded_; }

  // Appends the records of a statement of the shape.
  void Tell(LogicalLine& line, std::string& scratch) const {
    line.DirectAppendRows(row_count_, [&](size_t i) { return Make(i, line, scratch); });
    for (size_t i = row_count_; i < record_count_; ++i) {
      const Record record = Make(i, line, scratch);
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
  // What a copy of sixteen bytes may read behind a fixed text.
  static constexpr size_t kSlack = 16;

  size_t RecordsBegin() const { return key_size_; }
  size_t PiecesBegin() const { return RecordsBegin() + sizeof(RecordPlan) * record_count_; }
  size_t FixedBegin() const { return PiecesBegin() + sizeof(Piece) * piece_count_; }

  Record Make(size_t i, LogicalLine& line, std::string& scratch) const {
    RecordPlan plan;
    std::memcpy(&plan, bytes_.get() + RecordsBegin() + sizeof plan * i, sizeof plan);
    const Text name = Make(plan.name, line, scratch);
    const Text info = Make(plan.info, line, scratch);
    return {name.data(), info.data(), static_cast<uint32_t>(name.size()), static_cast<uint32_t>(info.size())};
  }

  Text Make(const TextPlan& plan, LogicalLine& line, std::string& scratch) const {
    switch (plan.origin) {
      case kFixed:
        return kFixedTexts[plan.first];
      case kTokens: {
        const char* const begin = line.toks[plan.first].text;
        return {begin, static_cast<size_t>(line.toks[plan.last].end() - begin)};
      }
      case kComposed:
        return Compose(plan, line);
      case kEncoded:
        break;
    }
    return Encode(plan, line, scratch);
  }

  Text Compose(const TextPlan& plan, LogicalLine& line) const {
    const uint8_t* const pieces = bytes_.get() + PiecesBegin() + sizeof(Piece) * plan.first;
    size_t size = 0;
    for (size_t i = 0; i < plan.last; ++i) {
      size += pieces[2 * i];
      if (pieces[2 * i + 1] != Piece::kNoToken) size += line.toks[pieces[2 * i + 1]].length;
    }
    char* const text = line.texts().Allocate(size);
    char* at = text;
    const auto append = [&at, limit = text + size](const char* from, size_t count) {
      // Most are short, and both sides may be read and written sixteen bytes at a time.
      if (count <= 16 && limit - at >= 16)
        std::memcpy(at, from, 16);
      else
        std::memcpy(at, from, count);
      at += count;
    };
    const char* fixed = reinterpret_cast<const char*>(bytes_.get()) + FixedBegin() + plan.fixed;
    for (size_t i = 0; i < plan.last; ++i) {
      append(fixed, pieces[2 * i]);
      fixed += pieces[2 * i];
      if (pieces[2 * i + 1] == Piece::kNoToken) continue;
      const Token& token = line.toks[pieces[2 * i + 1]];
      append(token.text, token.length);
    }
    return {text, size};
  }

  [[gnu::noinline]] Text Encode(const TextPlan& plan, LogicalLine& line, std::string& scratch) const {
    const uint8_t* const pieces = bytes_.get() + PiecesBegin() + sizeof(Piece) * plan.first;
    const char* fixed = reinterpret_cast<const char*>(bytes_.get()) + FixedBegin() + plan.fixed;
    scratch.clear();
    for (size_t i = 0; i < plan.last; ++i) {
      scratch.append(fixed, pieces[2 * i]);
      fixed += pieces[2 * i];
      const uint8_t token = pieces[2 * i + 1];
      if (token == Piece::kNoToken) continue;
      if ((token & Piece::kIsEncoded) != 0)
        AppendEncodedStringLiteral(line.toks[token & ~Piece::kIsEncoded].view(), scratch);
      else
        scratch.append(line.toks[token].view());
    }
    return line.texts().Copy(scratch);
  }

  bool is_whole_ = true;
  bool is_bounded_;
  uint8_t key_size_;
  uint8_t row_count_;
  uint8_t record_count_;
  uint8_t piece_count_;
  // The key, the records, the pieces, and the fixed texts that these refer to.
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

StatementShapes::StatementShapes(CPGenAnalyzerImpl& analyzer, uint8_t frequent)
    : analyzer_(analyzer), frequent_(frequent), is_able_(frequent != 0 && analyzer.HasNoKeywordsOfItsOwn()) {}

StatementShapes::~StatementShapes() = default;

bool StatementShapes::Tell(LogicalLine& line, const LinePlace& place, const TypingNames& typing) {
  if (!is_able_ || is_learning_ || !line.no_embedded || line.toks.size() > kMaxTokens ||
      line.kind == LineKind::kComment || typing.has_renamed_cast())
    return false;
  Key key;
  if (!key.Make(line, place.in_async_def)) return false;
  const uint64_t hash = key.Hash();
  const auto tag = static_cast<uint32_t>(hash);
  if (slots_.empty()) [[unlikely]] {
    slots_.resize(kSlots);
    counters_.resize(kCounters);
  }
  Slot& slot = slots_[hash >> 32 & (kSlots - 1)];
  if (slot.tag != tag || slot.plan == nullptr || !slot.plan->IsFor(key)) {
    if (!IsFrequent(hash)) return false;
    if (slot.plan != nullptr && slot.uses > 0) {
      --slot.uses;
      return false;
    }
    slot.plan = Learn(key, line, place.in_async_def);
    slot.tag = tag;
    slot.uses = kFirstUses;
  }
  slot.uses += slot.uses < kMostUses;
  const Plan& plan = *slot.plan;
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

std::unique_ptr<const StatementShapes::Plan> StatementShapes::Learn(const Key& key, const LogicalLine& line,
                                                                    bool in_async_def) {
  struct Learning {
    bool& is_on;
    ~Learning() { is_on = false; }
  };
  is_learning_ = true;
  const Learning learning{is_learning_};
  const MadeUp statement(key);
  made_up_records_.Reset();
  LogicalLine made_up;
  made_up.source = statement.source();
  made_up.toks = statement.toks();
  made_up.kind = line.kind;
  made_up.no_embedded = true;
  made_up.token_count = line.token_count;
  made_up.WriteTo(&made_up_records_);
  if (!analyzer_.WalkWithoutDoubt(made_up, in_async_def)) return std::make_unique<Plan>(key);
  const bool is_bounded = analyzer_.node_walker().met_operator_text();
  if (is_bounded && statement.MostJoined() > CNodeWalker::kMaxOperatorText) return std::make_unique<Plan>(key);
  PlanReader reader(statement);
  if (!reader.Read(made_up)) return std::make_unique<Plan>(key);
  reader.parts().is_bounded = is_bounded;
  return std::make_unique<Plan>(key, reader.parts());
}

}  // namespace quillet
