// A source read by an analyzer that tells statements from others of their shape, and by one that analyses each.
#pragma once

#include <string>
#include <vector>

#include "analysis/file_analyzer.h"

namespace quillet {

class BothWays {
 public:
  explicit BothWays(FileAnalyzer::Options options, uint8_t frequent_shape = 1)
      : told_(With(options, frequent_shape)), analysed_(With(options, 0)) {}

  // What is different, records and their places and errors; empty where nothing is.
  std::string Compare(Text source) {
    told_.Analyze(source);
    analysed_.Analyze(source);
    for (size_t i = 0; i < analysed_.results().size(); ++i) {
      const std::string told = ShowRow(told_, i);
      const std::string analysed = ShowRow(analysed_, i);
      if (told != analysed) return "told:\n" + told + "analysed:\n" + analysed;
    }
    return {};
  }

  const FileAnalyzer& told() const { return told_; }

 private:
  static FileAnalyzer::Options With(FileAnalyzer::Options options, uint8_t frequent_shape) {
    options.frequent_shape = frequent_shape;
    return options;
  }

  static void ShowText(const FileAnalyzer& file, Text text, std::string& out) {
    out.append(IsNone(text) ? "none" : text);
    if (file.source().Holds(text.data())) out += " at " + std::to_string(text.data() - file.source().begin());
    out += '\n';
  }

  static std::string ShowRow(const FileAnalyzer& file, size_t i) {
    std::string out;
    const LineRow& row = file.rows()[i];
    for (uint32_t k = 0; k < row.token_count; ++k)
      out.append(file.source().tokens[row.first_token + k].view()).append(" ");
    out += '\n';
    const FileAnalyzer::LineResult& result = file.results()[i];
    const auto show = [&](const std::vector<Record>& records, uint32_t begin, uint32_t end) {
      for (uint32_t at = begin; at < end; ++at) {
        ShowText(file, records[at].name(), out);
        ShowText(file, records[at].info(), out);
      }
    };
    show(file.store().rows, result.record_begin, result.record_end);
    out += "of parameters:\n";
    show(file.store().arg_rows, result.arg_record_begin, result.arg_record_end);
    if (result.error >= 0) out += file.errors()[static_cast<size_t>(result.error)].message() + "\n";
    return out;
  }

  FileAnalyzer told_;
  FileAnalyzer analysed_;
};

}  // namespace quillet
