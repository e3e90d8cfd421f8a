// From source text to trees and records, for tests: what a host does, in one call.
//
// A statement is cut, parsed and walked as the analyzer does it, and its records come back as short
// strings, "name info", those of parameters as "arg: name info", in the order in which they were
// made (parameters behind the others). A line that fails gives one string that begins with the name
// of the exception.
#pragma once

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "lines/cutter.h"
#include "lines/logical_line.h"
#include "parser/parser.h"
#include "walker/walker.h"

namespace quillet::testing {

inline constexpr Version kPy2 = Version::Of(2, 7);
inline constexpr Version kPy3 = Version::Of(3, 12);

inline CPGenParserImpl::Options ParserOptions(Version version) {
  const bool py3 = version.AtLeast(3, 0);
  CPGenParserImpl::Options options;
  options.version = version;
  options.py3_grammar = py3;
  options.grammar_file =
      std::string(QUILLET_SOURCE_DIR) + "/resources/pgen-grammars/" + (py3 ? kPy3DefaultGrammar : kPy2DefaultGrammar);
  for (const Text keyword : py3 ? Py3Keywords() : Py27Keywords()) options.keywords.emplace_back(keyword);
  return options;
}

// The parser for a version; building one takes long enough to share them among tests.
inline CPGenParserImpl& ParserFor(Version version) {
  static CPGenParserImpl py2(ParserOptions(kPy2));
  static CPGenParserImpl py3(ParserOptions(kPy3));
  return version.AtLeast(3, 0) ? py3 : py2;
}

// A source and its logical lines.
class CutSource {
 public:
  explicit CutSource(Text text, Version version = kPy3) : source_(SourceText::Copy(text)) {
    CutLines(*source_, version, rows_);
  }

  size_t size() const { return rows_.size(); }
  const LineRow& row(size_t i) const { return rows_[i]; }
  std::unique_ptr<LogicalLine> Line(size_t i) const {
    auto line = std::make_unique<LogicalLine>();
    SetFromRow(*line, source_, rows_[i]);
    return line;
  }

 private:
  Ref<SourceText> source_;
  std::vector<LineRow> rows_;
};

// The first logical line of a text with its tree, which goes back to the parser at the end.
class ParsedLine {
 public:
  explicit ParsedLine(Text text, Version version = kPy3)
      : parser_(ParserFor(version)), source_(text, version), line_(source_.Line(0)) {
    root_ = parser_.ParseToNode(*line_, /*in_async_def=*/false);
  }
  ~ParsedLine() {
    if (root_ != nullptr) parser_.DiscardNode(root_);
  }
  ParsedLine(const ParsedLine&) = delete;
  ParsedLine& operator=(const ParsedLine&) = delete;

  CNode* root() const { return root_; }
  LogicalLine& line() const { return *line_; }
  // The first node of a class, parents before children; null without one.
  template <class T>
  T* Find() const {
    return static_cast<T*>(FindIn(root_, [](const CNode* node) { return isa<T>(node); }));
  }

 private:
  template <class Test>
  static CNode* FindIn(CNode* node, Test test) {
    if (node == nullptr || test(node)) return node;
    for (CNode* child : node->fChildren()) {
      if (CNode* found = FindIn(child, test)) return found;
    }
    return nullptr;
  }

  CPGenParserImpl& parser_;
  CutSource source_;
  std::unique_ptr<LogicalLine> line_;
  CNode* root_ = nullptr;
};

inline std::vector<std::string> RecordStrings(const LogicalLine& line) {
  std::vector<std::string> strings;
  for (const Record& record : line.type_equivs()) {
    strings.push_back(std::string(record.name()).append(" ").append(record.info()));
  }
  for (const Record& record : line.arg_type_equivs()) {
    strings.push_back(std::string("arg: ").append(record.name()).append(" ").append(record.info()));
  }
  return strings;
}

// Cuts, parses and walks one line with the walker given.
inline void WalkLine(CNodeWalker& walker, LogicalLine& line, Version version) {
  CPGenParserImpl& parser = ParserFor(version);
  CNode* root = parser.ParseToNode(line, /*in_async_def=*/false);
  struct Discard {
    CPGenParserImpl& owner;
    CNode* node;
    ~Discard() {
      if (node != nullptr) owner.DiscardNode(node);
    }
  } discard{parser, root};
  walker.Walk(root, &line);
}

// The records of all logical lines of a text, walked by `walker`.
inline std::vector<std::string> RecordsOf(CNodeWalker& walker, Text text, Version version = kPy3) {
  std::vector<std::string> all;
  const CutSource source(text, version);
  for (size_t i = 0; i < source.size(); ++i) {
    const std::unique_ptr<LogicalLine> line = source.Line(i);
    std::string failure;
    try {
      WalkLine(walker, *line, version);
    } catch (const SyntaxError& error) {
      failure =
          "SyntaxError " + std::to_string(error.lineno) + ":" + std::to_string(error.offset) + " " + error.message();
    } catch (const ParseError& error) {
      failure = "ParseError " + std::to_string(error.context.value);
    } catch (const Error& error) {
      failure = std::string(HostExceptionName(error.kind())) + " " + error.message();
    }
    for (std::string& record : RecordStrings(*line)) all.push_back(std::move(record));
    if (!failure.empty()) all.push_back(std::move(failure));
  }
  return all;
}

inline std::vector<std::string> RecordsOf(Text text, Version version = kPy3) {
  CNodeWalker walker(version);
  return RecordsOf(walker, text, version);
}

}  // namespace quillet::testing
