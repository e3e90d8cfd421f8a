// What native analyzers are built from, as the host hands it in, and those that wait for their next source.
#pragma once

#include <limits>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "analysis/file_analyzer.h"
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "names/scope_rules.h"

namespace quillet::host {

class Language {
 public:
  Language(nb::handle version_triple, std::string grammar_file, std::string hint_grammar_file,
           std::vector<std::string> keywords, bool py3_grammar, std::string print_function_grammar_file, bool exact) {
    options_.version = VersionOf(version_triple);
    options_.grammar_file = std::move(grammar_file);
    options_.hint_grammar_file = std::move(hint_grammar_file);
    options_.hint_keywords = keywords;
    options_.keywords = std::move(keywords);
    options_.py3_grammar = py3_grammar;
    options_.reads_completely = !exact;
    options_.make_name_rules = MakeScopeRules;
    options_.print_function_grammar_file = std::move(print_function_grammar_file);
  }

  Language(const Language&) = delete;
  Language& operator=(const Language&) = delete;

  const FileAnalyzer::Options& options() const { return options_; }

  // An analyzer of nobody else's while this lives: one that waits, or a new one. It keeps whole errors, and takes
  // what memory there is. Made and let go of with the interpreter lock held.
  class Analyzer {
   public:
    explicit Analyzer(Language& language) : language_(language) {
      if (language.idle_.empty()) {
        FileAnalyzer::Options options = language.options_;
        options.keeps_whole_errors = true;
        options.least_memory_limit = std::numeric_limits<size_t>::max();
        files_ = std::make_unique<FileAnalyzer>(options);
      } else {
        files_ = std::move(language.idle_.back());
        language.idle_.pop_back();
      }
    }
    ~Analyzer() {
      if (language_.idle_.size() < kMostIdle) language_.idle_.push_back(std::move(files_));
    }
    Analyzer(const Analyzer&) = delete;
    Analyzer& operator=(const Analyzer&) = delete;

    FileAnalyzer* operator->() const { return files_.get(); }

   private:
    Language& language_;
    std::unique_ptr<FileAnalyzer> files_;
  };

 private:
  // As many as are at work at once in most programs.
  static constexpr size_t kMostIdle = 4;

  FileAnalyzer::Options options_;
  std::vector<std::unique_ptr<FileAnalyzer>> idle_;
};

}  // namespace quillet::host
