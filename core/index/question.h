// A question for a name: which records and occurrences answer it, and which words a file must hold to have one.
//
// Answers are found by analysing files as they are, never by what was stored of them, so a question is a
// writer of a batch like the formats of output/: it writes the records of a file that answer, and the
// occurrences that none of them tells of, such as a call with keywords or the second read in a statement.
// Words only save the analysis of files that cannot.
#pragma once

#include <functional>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "index/words.h"

namespace quillet {

struct Question {
  enum class Match : uint8_t {
    kEverything,  // all records, in the order in which they were found
    kExact,       // the name; with a dot also what is set in the scope that it names
    kSuffix,      // each name that ends in it, from a dot on
    kGlob,        // * stands for any text, ? for any character
  };
  Match match = Match::kEverything;
  std::string name;
  Uses uses = kAllUses;  // that are asked for
  bool returns = false;  // what functions of the name return and yield, too
  bool has_scope = false;
  std::string scope;  // around the records, by whole names or as a pattern
};

// A part of a word that a file must hold, in one of these uses.
struct WordPart {
  std::string text;
  bool at_begin = true;  // of the word
  bool at_end = true;
  Uses uses = 0;  // 0 for any, and none

  bool Fits(Text word, Uses word_uses) const;
};

// What a file that answers must hold: all parts of one of the alternatives.
using WordNeeds = std::vector<std::vector<WordPart>>;
WordNeeds WordsNeededBy(const Question& question);

// Whether a text is as a pattern of * and ? says.
bool FitsGlob(Text text, Text pattern);
// The words that are not as a pattern says, or a word, but differ from that by the case of letters alone.
std::vector<Text> WordsAlike(std::span<const WordTable::Entry> words, Text pattern);

// A record or an occurrence that answers. An occurrence that no record tells of has the kind of record that
// would, and no detail; its name is dotted as far as names go, and begins with a dot behind anything else.
struct Answer {
  uint32_t line = 0;    // from 1
  uint32_t column = 0;  // from 1, in UTF-8 bytes
  Text scope;
  Text name;
  Text detail;
  RecordKind kind = RecordKind::kSet;
  bool is_parameter = false;
  uint8_t opens = 0;  // what the name is set to: 1 a class, 2 a function
  // Of the occurrence that it is: its role + 1 (0 for a record that is none), and bits of NameFlag.
  uint8_t role = 0;
  uint8_t flags = 0;
  bool is_record = true;

  friend bool operator==(const Answer&, const Answer&) = default;
};

// The word of an answer's kind; where no kind of record tells of it, of what the occurrence does.
Text KindWordOf(const Answer& answer);

// How the answers of a file are written down.
class AnswerFormat {
 public:
  virtual ~AnswerFormat() = default;
  virtual void Write(const BatchInput& input, const SourceText& source, std::span<const Answer> answers,
                     std::string& out) = 0;
};

// Writes the answers of each file: by line and column and each once, unless everything is asked for.
std::unique_ptr<FileWriter> MakeQuestionWriter(const Question& question, Version version,
                                               std::unique_ptr<AnswerFormat> format);

// The source line of an answer, without its end and cut where it is very long.
Text SourceLineOf(const SourceText& source, const Answer& answer);

// For ReadAnswers; with the source lines where they are asked for.
std::unique_ptr<AnswerFormat> MakeAnswerBytes(bool with_lines);

// Calls `take(answer, line)` for what such a format wrote; the texts are views of it. `line` is the source
// line of the answer where lines were asked for; it has the same data as the one before where it is the
// same line. False where it is something else.
bool ReadAnswers(Text written, const std::function<void(const Answer&, Text line)>& take);

}  // namespace quillet
