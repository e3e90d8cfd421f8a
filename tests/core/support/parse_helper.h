// Trees of real statements for tests: the grammar files' own tables, fed with the tokens of one
// statement.
//
// A statement is written with a blank between any two tokens, so that no tokeniser is needed here;
// its text must outlive the tree, which is given back with the Tree object.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "parser/parser.h"
#include "tree/nodes.h"

namespace quillet::test {

class Tree {
 public:
  Tree(CPGenParserImpl* parser, CNode* root) : parser_(parser), root_(root) {}
  Tree(Tree&& other) noexcept : parser_(other.parser_), root_(std::exchange(other.root_, nullptr)) {}
  ~Tree() {
    if (root_ != nullptr) parser_->DiscardNode(root_);
  }

  CNode* root() const { return root_; }
  // The first node of a class, parents before children; null without one.
  template <class T>
  T* Find() const {
    return FindBelow<T>(root_);
  }

 private:
  template <class T>
  static T* FindBelow(CNode* node) {
    if (isa<T>(node)) return static_cast<T*>(node);
    for (CNode* child : node->fChildren()) {
      if (T* found = FindBelow<T>(child)) return found;
    }
    return nullptr;
  }

  CPGenParserImpl* parser_;
  CNode* root_;
};

// The parser of a grammar, made once a process.
inline CPGenParserImpl& ParserOf(bool py3) {
  auto make = [](bool is_py3) {
    CPGenParserImpl::Options options;
    options.version = is_py3 ? Version::Of(3, 8) : Version::Of(2, 7);
    options.grammar_file = std::string(QUILLET_SOURCE_DIR "/resources/pgen-grammars/") +
                           (is_py3 ? kPy3DefaultGrammar : kPy2DefaultGrammar);
    for (Text keyword : is_py3 ? Py3Keywords() : Py27Keywords()) options.keywords.emplace_back(keyword);
    options.py3_grammar = is_py3;
    return options;
  };
  static CPGenParserImpl parser2(make(false));
  static CPGenParserImpl parser3(make(true));
  return py3 ? parser3 : parser2;
}

inline Tree ParseStatement(bool py3, Text statement, bool in_async_def = false) {
  std::vector<Token> toks;
  while (!statement.empty()) {
    const size_t length = std::min(statement.find(' '), statement.size());
    if (length != 0) {
      const Text text = statement.substr(0, length);
      toks.push_back({text.data(), static_cast<uint32_t>(text.size()), CodeOfText(text)});
    }
    statement.remove_prefix(std::min(length + 1, statement.size()));
  }
  CPGenParserImpl& parser = ParserOf(py3);
  return Tree(&parser, parser.ParseTokenListToNode(toks, in_async_def));
}

inline Tree Parse2(Text statement) { return ParseStatement(false, statement); }
inline Tree Parse3(Text statement) { return ParseStatement(true, statement); }

}  // namespace quillet::test
