// From source text to records and errors through the analyzer, for tests.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "analysis/analyzer.h"
#include "foundations/console.h"
#include "tests/core/support/analysis_helper.h"

namespace quillet::testing {

inline CPGenAnalyzerImpl::Options AnalyzerOptions(Version version) {
  const CPGenParserImpl::Options code = ParserOptions(version);
  const CPGenParserImpl::Options hints = ParserOptions(kPy3);
  return {version, code.grammar_file, hints.grammar_file, code.keywords, hints.keywords, code.py3_grammar};
}

inline CPGenAnalyzerImpl& AnalyzerFor(Version version) {
  static CPGenAnalyzerImpl py2(AnalyzerOptions(kPy2));
  static CPGenAnalyzerImpl py3(AnalyzerOptions(kPy3));
  return version.AtLeast(3, 0) ? py3 : py2;
}

inline std::string ShowError(const SyntaxError& error) {
  return std::to_string(error.lineno) + ":" + std::to_string(error.offset) + " " + error.message();
}

// What the analysis of a line reported instead of raising it.
inline std::vector<std::string>& ReportedErrors() {
  static std::vector<std::string> errors;
  return errors;
}

// Collects reports and printed lines for as long as it lives.
class ConsoleCapture {
 public:
  ConsoleCapture() : before_(TheConsole()) {
    ReportedErrors().clear();
    PrintedLines().clear();
    TheConsole().report_exception = [](const std::exception_ptr& exception, bool) {
      ReportedErrors().push_back(ReprOfException(exception));
    };
    TheConsole().print_line = [](Text line) { PrintedLines().emplace_back(line); };
  }
  ~ConsoleCapture() { TheConsole() = before_; }
  ConsoleCapture(const ConsoleCapture&) = delete;
  ConsoleCapture& operator=(const ConsoleCapture&) = delete;

  static std::vector<std::string>& PrintedLines() {
    static std::vector<std::string> lines;
    return lines;
  }

 private:
  Console before_;
};

struct AnalyzedLine {
  std::vector<std::string> records;
  std::string error;  // empty without one
};

inline AnalyzedLine AnalyzeLine(LogicalLine& line, Version version = kPy3, bool in_async_def = false,
                                bool first_in_def = false) {
  const auto error = AnalyzerFor(version).AnalyzeSingleLogical(line, in_async_def, first_in_def);
  return {RecordStrings(line), error ? ShowError(*error) : ""};
}

// The first logical line of a text.
inline AnalyzedLine Analyze(Text text, Version version = kPy3, bool in_async_def = false, bool first_in_def = false) {
  const CutSource source(text, version);
  const std::unique_ptr<LogicalLine> line = source.Line(0);
  return AnalyzeLine(*line, version, in_async_def, first_in_def);
}

// Records that begin with a hint's prefix, as "name text"; those of parameters as "arg: name text".
inline std::vector<std::string> HintRecords(const AnalyzedLine& line) {
  std::vector<std::string> hints;
  for (const std::string& record : line.records) {
    const size_t prefix = record.find(" :h:");
    if (prefix != std::string::npos) hints.push_back(record.substr(0, prefix + 1) + record.substr(prefix + 4));
  }
  return hints;
}

// The names that were read, in order.
inline std::vector<std::string> ReadNames(const AnalyzedLine& line) {
  std::vector<std::string> names;
  for (const std::string& record : line.records)
    if (record.ends_with(" :g:")) names.push_back(record.substr(0, record.size() - 4));
  return names;
}

}  // namespace quillet::testing
