// Sources that no hand wrote, always the same ones: programs composed by the rules of tests/made/python.txt, shapes
// that repeat a few times and as often as a limit of the core allows, and fragments of code in any order.
//
// Every alternative of a rule is taken about as often as the others of it, so a few programs have all of them, each in
// many surroundings. Nothing here depends on a library's random numbers, which are others on another system.
#pragma once

#include <algorithm>
#include <cstdint>
#include <fstream>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "foundations/text.h"
#include "tests/core/support/shapes.h"

namespace quillet::testing {

class Chance {
 public:
  explicit Chance(uint32_t seed) : state_(seed * 2654435761u + 1) {}
  size_t Below(size_t count) {
    state_ = state_ * 1664525u + 1013904223u;
    return (state_ >> 8) % count;
  }

 private:
  uint32_t state_;
};

// Composes programs by rules; the file that holds them says how they are written.
class ProgramMaker {
 public:
  explicit ProgramMaker(const std::string& family) : family_(family) {
    std::ifstream in(QUILLET_SOURCE_DIR "/tests/made/python.txt", std::ios::binary);
    Rule* rule = nullptr;
    for (std::string line; std::getline(in, line);) {
      if (line.empty() || line[0] == '#') continue;
      if (line[0] == ' ') {
        rule->push_back({line.substr(2)});
      } else {
        rule = &rules_[line];
      }
    }
  }

  std::string Make() {
    made_.clear();
    depth_ = indent_ = 0;
    Say(rules_.at(family_));
    return made_;
  }

 private:
  // Of rules in rules. From the first on, the deeper the likelier the first way is taken; behind the second, always.
  static constexpr int kFree = 3, kMaxDepth = 10;

  struct Way {
    std::string text;
    int taken = 0;
  };
  using Rule = std::vector<Way>;

  // Of two at random, the one that was taken less.
  Way& Choose(Rule& rule) {
    if (kFree + static_cast<int>(chance_.Below(kMaxDepth - kFree)) < depth_) return rule[0];
    Way& one = rule[chance_.Below(rule.size())];
    Way& other = rule[chance_.Below(rule.size())];
    return other.taken < one.taken ? other : one;
  }

  void Say(Rule& rule) {
    Way& way = Choose(rule);
    ++way.taken;
    ++depth_;
    const std::string& text = way.text;
    for (size_t at = 0; at < text.size(); ++at) {
      if (text[at] == '\\') {
        SayMark(text[++at]);
      } else if (const size_t end = text.find('>', at); text[at] == '<' && end != std::string::npos) {
        const auto found = rules_.find(text.substr(at + 1, end - at - 1));
        if (found == rules_.end()) {
          made_ += '<';
        } else {
          Say(found->second);
          at = end;
        }
      } else {
        made_ += text[at];
      }
    }
    --depth_;
  }

  void SayMark(char mark) {
    indent_ += mark == '>';
    indent_ -= mark == '<';
    if (mark == 'n' || mark == '>') {
      made_ += '\n' + std::string(static_cast<size_t>(indent_) * 4, ' ');
    } else if (mark != '<') {
      static constexpr Text kMarks = "stfr", kMeant = " \t\f\r";
      const size_t known = kMarks.find(mark);
      made_ += known == Text::npos ? mark : kMeant[known];
    }
  }

  std::string family_;
  std::map<std::string, Rule> rules_;
  // Another beginning for each family.
  Chance chance_{static_cast<uint32_t>(family_[0] * family_[1] + family_.back())};
  std::string made_;
  int depth_ = 0;
  int indent_ = 0;
};

// The files of a program, which lie in one folder, by their paths.
using MadeProgram = std::vector<std::pair<std::string, std::string>>;

inline std::vector<MadeProgram> ComposedPrograms(const std::string& family, int count) {
  ProgramMaker maker(family);
  std::vector<MadeProgram> programs;
  for (int i = 0; i < count; ++i) {
    MadeProgram& program = programs.emplace_back();
    program.emplace_back("a.py", maker.Make());
    if (family != "modules") continue;
    for (const char* path : {"p/__init__.py", "p/q.py", "m.py"}) program.emplace_back(path, maker.Make());
  }
  return programs;
}

inline std::vector<MadeProgram> RepeatedShapes(int count) {
  std::vector<MadeProgram> programs;
  for (const Shape& shape : Shapes()) programs.push_back({{"a.py", Make(shape, static_cast<size_t>(count))}});
  return programs;
}

inline std::vector<MadeProgram> ShapesAtLimits() {
  std::vector<MadeProgram> programs;
  for (const auto& [shape, limits] : LimitedShapes())
    for (const size_t limit : limits)
      for (const size_t count : {limit - 1, limit, limit + 1}) programs.push_back({{"a.py", Make(shape, count)}});
  return programs;
}

inline std::vector<MadeProgram> FragmentsInAnyOrder(int count) {
  Chance chance(2);
  std::vector<MadeProgram> programs;
  for (int i = 0; i < count; ++i) {
    std::string text;
    for (size_t left = 2 + chance.Below(80); left > 0; --left) text += Fragments()[chance.Below(Fragments().size())];
    programs.push_back({{"a.py", text + "\n"}});
  }
  return programs;
}

struct MadeFamily {
  std::string name;
  int count;             // of programs, or times that each shape is said
  size_t places;         // of a file that are asked about
  bool is_long = false;  // these are read as the newest version alone

  std::vector<MadeProgram> Make() const {
    if (name == "limits") return ShapesAtLimits();
    if (name == "fragments") return FragmentsInAnyOrder(count);
    if (name.starts_with("shapes_")) return RepeatedShapes(count);
    return ComposedPrograms(name.substr(0, name.find("_27")), count);
  }
};

inline const std::vector<MadeFamily>& MadeFamilies() {
  static const std::vector<MadeFamily> families = {
      {"expressions", 20, 6}, {"statements", 20, 12}, {"older_27", 20, 6},    {"hints", 20, 10},
      {"patterns", 20, 10},   {"lines", 20, 6},       {"strings", 20, 6},     {"errors", 45, 4},
      {"scopes", 20, 10},     {"types", 24, 25},      {"classes", 30, 25},    {"generics", 24, 25},
      {"flow", 24, 25},       {"calls", 24, 20},      {"docstrings", 20, 15}, {"modules", 7, 20},
      {"ignore", 20, 1},      {"shapes_3", 3, 1},     {"fragments", 60, 2},   {"limits", 0, 2, true}};
  return families;
}

}  // namespace quillet::testing
