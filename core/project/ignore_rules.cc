// A rule becomes a literal head and a list of steps; a match carries the set of reached steps byte by byte.
#include "project/ignore_rules.h"

#include <algorithm>

namespace quillet {

namespace {

constexpr Text kUtf8Mark = "\xEF\xBB\xBF";
constexpr Text kSpecial = "*?[\\";

// A line up to the blanks at its end; a backslash keeps the character behind it.
Text WithoutBlanksAtEnd(Text line) {
  size_t end = 0;
  for (size_t at = 0; at < line.size(); ++at) {
    if (line[at] == '\\') {
      if (++at == line.size()) return line;
      end = at + 1;
    } else if (line[at] != ' ') {
      end = at + 1;
    }
  }
  return line.substr(0, end);
}

struct NamedClass {
  Text name;
  bool (*holds)(uint8_t c);
};

constexpr bool IsLower(uint8_t c) { return c >= 'a' && c <= 'z'; }
constexpr bool IsUpper(uint8_t c) { return c >= 'A' && c <= 'Z'; }
constexpr bool IsAlpha(uint8_t c) { return IsLower(c) || IsUpper(c); }
constexpr bool IsDigit(uint8_t c) { return c >= '0' && c <= '9'; }
constexpr bool IsSpace(uint8_t c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }
constexpr bool IsPrint(uint8_t c) { return c >= 0x20 && c <= 0x7E; }

constexpr std::array<NamedClass, 12> kClasses = {{
    {"alnum", [](uint8_t c) { return IsAlpha(c) || IsDigit(c); }},
    {"alpha", IsAlpha},
    {"blank", [](uint8_t c) { return c == ' ' || c == '\t'; }},
    {"cntrl", [](uint8_t c) { return c < 0x20 || c == 0x7F; }},
    {"digit", IsDigit},
    {"graph", [](uint8_t c) { return IsPrint(c) && !IsSpace(c); }},
    {"lower", IsLower},
    {"print", IsPrint},
    {"punct", [](uint8_t c) { return IsPrint(c) && c != ' ' && !IsAlpha(c) && !IsDigit(c); }},
    {"space", IsSpace},
    {"upper", IsUpper},
    {"xdigit", [](uint8_t c) { return IsDigit(c) || (c >= 'a' && c <= 'f') || (c >= 'A' && c <= 'F'); }},
}};

const NamedClass* ClassNamed(Text name) {
  const auto found =
      std::find_if(kClasses.begin(), kClasses.end(), [&](const NamedClass& c) { return c.name == name; });
  return found == kClasses.end() ? nullptr : &*found;
}

}  // namespace

IgnoreRules::IgnoreRules(Text text) {
  if (text.starts_with(kUtf8Mark)) text.remove_prefix(kUtf8Mark.size());
  while (!text.empty()) {
    const size_t end = text.find('\n');
    Text line = text.substr(0, end);
    text.remove_prefix(end == Text::npos ? text.size() : end + 1);
    if (line.ends_with('\r')) line.remove_suffix(1);
    if (!line.starts_with('#')) Add(WithoutBlanksAtEnd(line.substr(0, line.find('\0'))));
  }
}

IgnoreRules::Verdict IgnoreRules::Of(Text path, bool is_folder) {
  const Text last_part = path.substr(path.rfind('/') + 1);
  for (auto rule = rules_.rbegin(); rule != rules_.rend(); ++rule) {
    if (rule->folders_only && !is_folder) continue;
    if (Matches(*rule, rule->last_part_only ? last_part : path))
      return rule->includes ? Verdict::kIncluded : Verdict::kExcluded;
  }
  return Verdict::kNone;
}

// ---- reading ----

void IgnoreRules::Add(Text line) {
  Rule rule;
  if (line.starts_with('!')) {
    rule.includes = true;
    line.remove_prefix(1);
  }
  if (line.ends_with('/')) {
    rule.folders_only = true;
    line.remove_suffix(1);
  }
  if (line.empty()) return;
  rule.last_part_only = line.find('/') == Text::npos;
  if (line.starts_with('/')) line.remove_prefix(1);
  const size_t head = std::min(line.find_first_of(kSpecial), line.size());
  rule.head = line.substr(0, head);
  // What is behind the head is a pattern of its own: stars at its beginning count as behind a slash.
  if (!AddSteps(line.substr(head), rule)) return;
  Prepare(rule);
  rules_.push_back(std::move(rule));
}

bool IgnoreRules::AddSteps(Text pattern, Rule& rule) {
  for (size_t at = 0; at < pattern.size();) {
    switch (pattern[at]) {
      case '?':
        rule.steps.push_back({StepKind::kPartByte});
        ++at;
        break;
      case '*':
        at = AddStars(pattern, at, rule);
        break;
      case '[':
        if (!AddSet(pattern, at, rule)) return false;
        break;
      case '\\':
        if (++at == pattern.size()) return false;
        [[fallthrough]];
      default:
        rule.steps.push_back({StepKind::kByte, static_cast<uint8_t>(pattern[at])});
        ++at;
    }
  }
  return true;
}

// Adds the stars that begin at `at`, and gives the place behind them.
size_t IgnoreRules::AddStars(Text pattern, size_t at, Rule& rule) {
  const size_t begin = at;
  while (at < pattern.size() && pattern[at] == '*') ++at;
  const Text rest = pattern.substr(at);
  const bool is_part =
      (begin == 0 || pattern[begin - 1] == '/') && (rest.empty() || rest.starts_with('/') || rest.starts_with("\\/"));
  if (at - begin == 1 || !is_part) {
    rule.steps.push_back({StepKind::kPartBytes});
  } else if (rest.starts_with('/')) {
    rule.steps.push_back({StepKind::kFolders});
    ++at;
  } else {
    rule.steps.push_back({StepKind::kBytes});
  }
  return at;
}

// Adds the set whose bracket stands at `at`, and moves behind it; false where it is none.
bool IgnoreRules::AddSet(Text pattern, size_t& at, Rule& rule) {
  const auto byte_at = [&](size_t i) { return static_cast<uint8_t>(pattern[i]); };
  ByteSet set;
  ++at;
  const bool negated = at < pattern.size() && (pattern[at] == '!' || pattern[at] == '^');
  if (negated) ++at;
  // A bracket that closes is an ordinary character in the first place.
  int first_of_range = -1;
  for (bool first = true; first || at >= pattern.size() || pattern[at] != ']'; first = false) {
    if (at >= pattern.size()) return false;
    int last = -1;
    if (pattern[at] == '-' && first_of_range >= 0 && at + 1 < pattern.size() && pattern[at + 1] != ']') {
      ++at;
      if (pattern[at] == '\\' && ++at == pattern.size()) return false;
      for (int c = first_of_range; c <= byte_at(at); ++c) set.set(static_cast<size_t>(c));
    } else if (pattern.substr(at).starts_with("[:")) {
      const size_t name = at + 2;
      const size_t close = pattern.find(']', name);
      if (close == Text::npos) return false;
      if (close > name && pattern[close - 1] == ':') {
        const NamedClass* const named = ClassNamed(pattern.substr(name, close - 1 - name));
        if (named == nullptr) return false;
        for (size_t c = 0; c < set.size(); ++c) {
          if (named->holds(static_cast<uint8_t>(c))) set.set(c);
        }
        at = close;
      } else {
        last = byte_at(at);
      }
    } else {
      if (pattern[at] == '\\' && ++at == pattern.size()) return false;
      last = byte_at(at);
    }
    if (last >= 0) set.set(static_cast<size_t>(last));
    first_of_range = last > 0 ? last : -1;
    ++at;
  }
  ++at;
  if (negated) set.flip();
  set.reset('/');
  rule.steps.push_back({StepKind::kSet, 0, static_cast<uint32_t>(sets_.size())});
  sets_.push_back(set);
  return true;
}

// Derives what settles most matches at once.
void IgnoreRules::Prepare(Rule& rule) {
  std::string run;
  for (const Step& step : rule.steps) {
    if (step.kind != StepKind::kByte) {
      run.clear();
    } else {
      run += static_cast<char>(step.byte);
      if (run.size() > rule.needle.size()) rule.needle = run;
    }
    rule.least_size += step.kind <= StepKind::kSet;
  }
  rule.tail = run;
}

// ---- matching ----

bool IgnoreRules::Matches(const Rule& rule, Text path) {
  if (!path.starts_with(rule.head)) return false;
  path.remove_prefix(rule.head.size());
  if (rule.steps.empty()) return path.empty();
  if (path.size() < rule.least_size || !path.ends_with(rule.tail)) return false;
  if (rule.needle.size() > rule.tail.size() && path.find(rule.needle) == Text::npos) return false;
  return TakesAll(rule.steps, path);
}

bool IgnoreRules::TakesAll(const std::vector<Step>& steps, Text path) {
  reached_at_.assign(steps.size() + 1, 0);
  at_byte_ = 1;
  reached_next_.clear();
  Reach(steps, 0);
  for (const char byte : path) {
    reached_.swap(reached_next_);
    reached_next_.clear();
    ++at_byte_;
    const auto c = static_cast<uint8_t>(byte);
    for (const uint32_t at : reached_) {
      if (at == steps.size()) continue;
      const Step& step = steps[at];
      switch (step.kind) {
        case StepKind::kByte:
          if (c == step.byte) Reach(steps, at + 1);
          break;
        case StepKind::kPartByte:
          if (c != '/') Reach(steps, at + 1);
          break;
        case StepKind::kSet:
          if (sets_[step.set][c]) Reach(steps, at + 1);
          break;
        case StepKind::kPartBytes:
          if (c != '/') Reach(steps, at);
          break;
        case StepKind::kBytes:
          Reach(steps, at);
          break;
        case StepKind::kFolders:
          // Not begun anew, so it ends behind a slash alone; what is in front of it in a pattern is one, too.
          if (reached_at_[at] != at_byte_) {
            reached_at_[at] = at_byte_;
            reached_next_.push_back(at);
          }
          if (c == '/') Reach(steps, at + 1);
          break;
      }
    }
    if (reached_next_.empty()) return false;
  }
  return reached_at_.back() == at_byte_;
}

// Marks a step as reached, and those behind it as far as they are reached without a byte.
void IgnoreRules::Reach(const std::vector<Step>& steps, size_t step) {
  while (reached_at_[step] != at_byte_) {
    reached_at_[step] = at_byte_;
    reached_next_.push_back(static_cast<uint32_t>(step));
    if (step == steps.size() || steps[step].kind < StepKind::kPartBytes) return;
    ++step;
  }
}

}  // namespace quillet
