// The loop over the lines of a source. Everything that costs is below: cutting, parsing, walking.
#include "analysis/file_analyzer.h"

#include <algorithm>
#include <utility>

#include "lines/future_imports.h"

namespace quillet {

FileAnalyzer::FileAnalyzer(const Options& options) : options_(options), analyzer_(options) {
  found_.source = SourceText::Copy(Text(""));
}

FileAnalyzer::Found FileAnalyzer::TakeFound() {
  Found fresh;
  fresh.source = SourceText::Copy(Text(""));
  return std::exchange(found_, std::move(fresh));
}

CPGenAnalyzerImpl& FileAnalyzer::AnalyzerForSource() {
  if (options_.print_function_grammar_file.empty() || !ImportsPrintFunction(*found_.source, found_.rows))
    return analyzer_;
  if (print_function_analyzer_ == nullptr) {
    CPGenAnalyzerImpl::Options options = options_;
    options.grammar_file = options_.print_function_grammar_file;
    std::erase(options.keywords, "print");
    print_function_analyzer_ = std::make_unique<CPGenAnalyzerImpl>(options);
  }
  return *print_function_analyzer_;
}

void FileAnalyzer::Analyze(Text bytes) {
  found_.rows.clear();
  found_.results.clear();
  found_.errors.clear();
  found_.store.Reset();
  scopes_.Reset();
  found_.source->Assign(bytes);
  CutLines(*found_.source, options_.version, found_.rows);
  CPGenAnalyzerImpl& analyzer = AnalyzerForSource();
  found_.results.reserve(found_.rows.size());

  LogicalLine line;
  for (const LineRow& row : found_.rows) {
    LineResult result;
    const LinePlace place = scopes_.Next(row);
    result.in_async_def = place.in_async_def;
    result.first_in_def = place.first_in_def;
    result.depth = place.depth;
    result.record_begin = static_cast<uint32_t>(found_.store.rows.size());
    result.arg_record_begin = static_cast<uint32_t>(found_.store.arg_rows.size());
    if (row.token_count != 0) {
      SetFromRow(line, found_.source, row);
      line.parsed = false;
      line.WriteTo(&found_.store);
      if (auto error = analyzer.AnalyzeSingleLogical(line, place.in_async_def, place.first_in_def)) {
        result.error = static_cast<int32_t>(found_.errors.size());
        found_.errors.push_back(std::move(*error));
      }
    }
    result.record_end = static_cast<uint32_t>(found_.store.rows.size());
    result.arg_record_end = static_cast<uint32_t>(found_.store.arg_rows.size());
    found_.results.push_back(result);
  }
}

Position FileAnalyzer::ErrorPosition(size_t row) const {
  // An error's own line and offset count from 1, from the first line of its statement.
  const SyntaxError& error = found_.errors[static_cast<size_t>(found_.results[row].error)];
  const int64_t line = static_cast<int64_t>(found_.rows[row].first_line) + std::max<int64_t>(error.lineno, 1) - 1;
  return {static_cast<int32_t>(line), static_cast<int32_t>(std::max<int64_t>(error.offset, 1) - 1)};
}

size_t FileAnalyzer::LineCount() const {
  const std::vector<uint32_t>& starts = found_.source->line_starts;
  // A line end at the end of the source begins no line.
  return starts.size() - (!starts.empty() && starts.back() == found_.source->size() ? 1 : 0);
}

}  // namespace quillet
