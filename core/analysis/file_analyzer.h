// FileAnalyzer: a whole source at once, bytes in, records of all its lines out, no host in between.
//
// It cuts the bytes into logical lines, works out each line's place (inside an `async def`, first in
// a function body) and hands line after line to an analyzer. All memory is kept for the next
// source: tokens, rows, records and nodes; what a huge source took of it goes back. One thread at a time
// per analyzer.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "analysis/analyzer.h"
#include "analysis/block_rules.h"
#include "analysis/line_result.h"
#include "analysis/name_rules.h"
#include "analysis/statement_shapes.h"
#include "lines/cutter.h"

namespace quillet {

// Says which rows of a source are to be analysed, for who looks for something that few of them can hold. The others
// have no records and no error. Each thread has one.
class RowFilter {
 public:
  virtual ~RowFilter() = default;
  // False where all of them are. `wanted` has a place a row, all false.
  virtual bool Choose(const SourceText& source, std::span<const LineRow> rows, std::vector<bool>& wanted) = 0;
};

class FileAnalyzer {
 public:
  using LineResult = quillet::LineResult;

  // What became of a statement that does not parse. Where every byte is one, what it takes decides.
  struct Failure {
    const std::string* text;  // one for all failures of a kind
    Position place;           // line and offset from 1, counted from the first line of the statement
    SyntaxError::Kind error_class = SyntaxError::Kind::kSyntax;

    const std::string& message() const { return *text; }
  };

  // What the analysis of a source may hold: so many bytes, or so many a byte of the source where that is
  // more. Files that people write take 20 to 60 bytes a byte; what is made to do harm takes hundreds.
  static constexpr size_t kMemoryPerSourceByte = 10;
  static constexpr size_t kLeastMemoryLimit = size_t{1} << 30;

  // Where Options::reads_completely is set, lines are read by AnalyzeCompletely.
  struct Options : CPGenAnalyzerImpl::Options {
    // The grammar for sources of 2.7 that switch the print function on; empty where the version has
    // no such switch.
    std::string print_function_grammar_file;
    size_t least_memory_limit = kLeastMemoryLimit;
    // Whether errors that show another text than their statement's are kept whole as well.
    bool keeps_whole_errors = false;
    // What is asked about the names of a source that is read completely; null: nothing is.
    std::unique_ptr<NameRules> (*make_name_rules)(Version) = nullptr;
    // How often the shape of a statement is met until others are told from it, which is faster and says the same;
    // 0: each is analysed.
    uint8_t frequent_shape = StatementShapes::kFrequent;
  };

  explicit FileAnalyzer(const Options& options);

  // What an analysis found, as an object of its own.
  struct Found {
    Ref<SourceText> source;
    std::vector<LineRow> rows;
    std::vector<LineResult> results;  // parallel to the rows
    RecordStore store;
    std::vector<Failure> errors;
    std::unordered_set<std::string> error_texts;           // that those refer to
    std::unordered_map<size_t, SyntaxError> whole_errors;  // by row: those that show texts of their own

    // The error of a row, which must have one, with the text that it shows; of an analysis that keeps whole errors.
    SyntaxError WholeErrorOf(size_t row) const;
  };

  // Results stand until the next call. The bytes are copied. OverflowError for a source that takes more
  // memory than it may.
  void Analyze(Text bytes, RowFilter* filter = nullptr);
  // The same for what is made of the results: OverflowError where `more` bytes are too many beside them.
  void CheckMemory(size_t more) const {
    if (held_ + more > memory_limit_) [[unlikely]]
      ThrowTooLarge();
  }

  // Gives the results away, and leaves none.
  Found TakeFound();

  const SourceText& source() const { return *found_.source; }
  std::span<const LineRow> rows() const { return found_.rows; }
  std::span<const LineResult> results() const { return found_.results; }
  // The row that is read, or how many there are when all of them were.
  size_t row_under_way() const { return row_under_way_; }
  const RecordStore& store() const { return found_.store; }
  const std::vector<Failure>& errors() const { return found_.errors; }
  // Where the error of a row lies in the source; the row must have one.
  Position ErrorPosition(size_t row) const;
  // The number of physical lines.
  size_t LineCount() const;

 private:
  // An analyzer, and the shapes of the statements that it met.
  struct Analyzer {
    Analyzer(const CPGenAnalyzerImpl::Options& options, uint8_t frequent_shape)
        : analyzer(options), shapes(analyzer, frequent_shape) {}

    CPGenAnalyzerImpl analyzer;
    StatementShapes shapes;
  };

  // The one that reads the source as it asks to be read.
  Analyzer& AnalyzerForSource();
  void Reset(Text bytes);
  void Cut();
  // Makes the results of the rows, which tell nothing but their places yet.
  void FindPlaces();
  // The index of its error, or -1.
  int32_t AnalyzeRow(Analyzer& analyzer, size_t row, LogicalLine& line);
  int32_t AnalyzeLine(CPGenAnalyzerImpl& analyzer, size_t row, LogicalLine& line, bool is_doubtful);
  // Returns its index.
  int32_t AddError(size_t row, const SyntaxError& error);
  // What the line that was just read has to say to those around it.
  void Note(const CPGenAnalyzerImpl& analyzer, size_t row);
  void AddFindings(CPGenAnalyzerImpl& analyzer);
  void ApplyNameRules();
  // What the analysis of a row may take beside its results, at most.
  size_t MostMemoryOf(const LineRow& row) const;
  // Counts what the results hold by now.
  inline void CountMemory();
  [[noreturn]] void ThrowTooLarge() const;

  Options options_;
  Analyzer analyzer_;
  std::unique_ptr<Analyzer> print_function_analyzer_;  // built at first need
  Found found_;
  std::vector<bool> wanted_;  // of the rows, where there is a filter
  size_t row_under_way_ = 0;
  BlockRules::Readings readings_;
  BlockRules block_rules_;
  std::unique_ptr<NameRules> name_rules_;  // built at first need
  TypingNames typing_;
  size_t memory_limit_ = kLeastMemoryLimit;
  size_t held_before_ = 0;  // by what was cut, before the first line was analysed
  size_t held_ = 0;
};

}  // namespace quillet
