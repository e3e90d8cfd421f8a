// FileAnalyzer: a whole source at once, bytes in, records of all its lines out, no host in between.
//
// It cuts the bytes into logical lines, works out each line's place (inside an `async def`, first in
// a function body) and hands line after line to an analyzer. All memory is kept for the next
// source: tokens, rows, records and nodes. One thread at a time per analyzer.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "analysis/analyzer.h"
#include "lines/cutter.h"
#include "lines/scopes.h"

namespace quillet {

class FileAnalyzer {
 public:
  // What became of one logical line: its place, and its ranges of records. Parallel to rows().
  struct LineResult {
    uint32_t record_begin = 0, record_end = 0;          // in store().rows
    uint32_t arg_record_begin = 0, arg_record_end = 0;  // in store().arg_rows
    int32_t error = -1;                                 // index in errors(), -1 without one
    uint32_t depth = 0;                                 // of the definitions around it
    bool in_async_def = false;
    bool first_in_def = false;
  };

  struct Options : CPGenAnalyzerImpl::Options {
    // The grammar for sources of 2.7 that switch the print function on; empty where the version has
    // no such switch.
    std::string print_function_grammar_file;
  };

  explicit FileAnalyzer(const Options& options);

  // What an analysis found, as an object of its own.
  struct Found {
    Ref<SourceText> source;
    std::vector<LineRow> rows;
    std::vector<LineResult> results;
    RecordStore store;
    std::vector<SyntaxError> errors;
  };

  // Results stand until the next call. The bytes are copied.
  void Analyze(Text bytes);
  // Gives the results away, and leaves none.
  Found TakeFound();

  const SourceText& source() const { return *found_.source; }
  std::span<const LineRow> rows() const { return found_.rows; }
  std::span<const LineResult> results() const { return found_.results; }
  const RecordStore& store() const { return found_.store; }
  const std::vector<SyntaxError>& errors() const { return found_.errors; }
  // Where the error of a row lies in the source; the row must have one.
  Position ErrorPosition(size_t row) const;
  // The number of physical lines.
  size_t LineCount() const;

 private:
  // The analyzer that reads the source as it asks to be read.
  CPGenAnalyzerImpl& AnalyzerForSource();

  Options options_;
  CPGenAnalyzerImpl analyzer_;
  std::unique_ptr<CPGenAnalyzerImpl> print_function_analyzer_;  // built at first need
  Found found_;
  ScopeTracker scopes_;
};

}  // namespace quillet
