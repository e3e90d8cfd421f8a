// The loop over the lines of a source. Everything that costs is below: cutting, parsing, walking.
#include "analysis/file_analyzer.h"

#include <algorithm>

#include "lines/future_imports.h"

namespace quillet {

FileAnalyzer::FileAnalyzer(const Options& options)
    : options_(options), analyzer_(options), source_(SourceText::Copy(Text(""))) {}

CPGenAnalyzerImpl& FileAnalyzer::AnalyzerForSource() {
  if (options_.print_function_grammar_file.empty() || !ImportsPrintFunction(*source_, rows_)) return analyzer_;
  if (print_function_analyzer_ == nullptr) {
    CPGenAnalyzerImpl::Options options = options_;
    options.grammar_file = options_.print_function_grammar_file;
    std::erase(options.keywords, "print");
    print_function_analyzer_ = std::make_unique<CPGenAnalyzerImpl>(options);
  }
  return *print_function_analyzer_;
}

void FileAnalyzer::Analyze(Text bytes) {
  rows_.clear();
  results_.clear();
  errors_.clear();
  store_.Reset();
  scopes_.Reset();
  source_->Assign(bytes);
  CutLines(*source_, options_.version, rows_);
  CPGenAnalyzerImpl& analyzer = AnalyzerForSource();
  results_.reserve(rows_.size());

  LogicalLine line;
  for (const LineRow& row : rows_) {
    LineResult result;
    const LinePlace place = scopes_.Next(row);
    result.in_async_def = place.in_async_def;
    result.first_in_def = place.first_in_def;
    result.depth = place.depth;
    result.record_begin = static_cast<uint32_t>(store_.rows.size());
    result.arg_record_begin = static_cast<uint32_t>(store_.arg_rows.size());
    if (row.token_count != 0) {
      SetFromRow(line, source_, row);
      line.parsed = false;
      line.WriteTo(&store_);
      if (auto error = analyzer.AnalyzeSingleLogical(line, place.in_async_def, place.first_in_def)) {
        result.error = static_cast<int32_t>(errors_.size());
        errors_.push_back(std::move(*error));
      }
    }
    result.record_end = static_cast<uint32_t>(store_.rows.size());
    result.arg_record_end = static_cast<uint32_t>(store_.arg_rows.size());
    results_.push_back(result);
  }
}

Position FileAnalyzer::ErrorPosition(size_t row) const {
  // An error's own line and offset count from 1, from the first line of its statement.
  const SyntaxError& error = errors_[static_cast<size_t>(results_[row].error)];
  const int64_t line = static_cast<int64_t>(rows_[row].first_line) + std::max<int64_t>(error.lineno, 1) - 1;
  return {static_cast<int32_t>(line), static_cast<int32_t>(std::max<int64_t>(error.offset, 1) - 1)};
}

size_t FileAnalyzer::LineCount() const {
  const std::vector<uint32_t>& starts = source_->line_starts;
  // A line end at the end of the source begins no line.
  return starts.size() - (!starts.empty() && starts.back() == source_->size() ? 1 : 0);
}

}  // namespace quillet
