// CTypeHintWalker finds type information in a statement and records it on the logical line: from
// annotations, and from comments of the form "# type: ...".
//
// A comment's hint is text, so it is parsed here, with a parser of its own; the names in it are
// recorded by the general walker, whose walk of the statement has ended by then. A hint that does
// not parse is a SyntaxError at its column in the comment. Signature comments, "(int, str) -> bool",
// are in signature_comments.cc. A line without "type:" in a comment costs one pass over its token
// codes and, where its tree cannot reach a limit, a walk of its statements alone.
//
// The text of a comment's hint is copied to where the line's records keep theirs before it is parsed,
// so that what is recorded from it lives as long as they do.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "hints/dispatch_walker.h"
#include "lines/cutter.h"
#include "parser/parser.h"
#include "text/node_to_text.h"
#include "walker/walker.h"

namespace quillet {

class CompleteParser;

class CTypeHintWalker : public CDispatchWalker {
 public:
  // `general_node_walker` may be null; it is not owned.
  CTypeHintWalker(std::unique_ptr<CPGenParserImpl> hint_parser, Version version, CNodeWalker* general_node_walker);

  // For the tree that was parsed from the line.
  void Walk(CNode* node, LogicalLine* logical, bool first_in_def) override;
  // For a tree of a host's, which the line says nothing of: always visits every node.
  void WalkAnyTree(CNode* node, LogicalLine* logical, bool first_in_def);

  // ---- complete readings (complete_hints.cc) ----
  // For hosts that want every hint: any comment that tells a type checker to look away holds none, signatures
  // have all their forms, and a hint that cannot be read is kept as an error and takes nothing else with it.
  // `parser` makes nodes of this walker's factory and is not owned.
  void ReadCompletely(CompleteParser* parser);
  // What the first hint of the last walk that could not be read was rejected with.
  const std::optional<SyntaxError>& hint_error() const { return hint_error_; }
  // Whether the function that is walked is a method, whose signature may leave its object out.
  bool in_class = false;

  // ---- comments (hint_walker.cc) ----
  struct Comment {
    Text text = kNoText;
    int32_t tok_i = -1;
  };
  struct Hint {
    bool found = false;
    std::string text;
    int32_t tok_i = -1;
  };
  Hint FindEndingTypeComment(CNode* node) const;
  // False: no hint. The hint keeps each character at its column in the comment (blanks stand for
  // the characters in front of it).
  static bool GetHintFromComment(Text comment, std::string& hint);
  // First row, and the row behind the last.
  std::pair<int64_t, int64_t> GetRowRange(CNode* node) const;
  // The first comment on a row of a line, by default of the one being walked.
  Comment FindComment(int64_t row, LogicalLine* logical = nullptr) const;
  static bool IsDottedName(Text text);
  // Null for a hint that is not exactly one statement. The tree is the caller's.
  CNode* ParseHint(Text hint, int32_t tok_i, bool call_general_node_walker);
  [[noreturn]] void RaiseHintSyntaxError(int32_t tok_i, int64_t utf8_offset_in_hint);

  // ---- statements (hint_walker.cc) ----
  bool VisitExprStmt(CNode* node);
  bool VisitForStmt(CNode* node);
  bool VisitWithStmt(CNode* node);
  void ProcessTarget(CNode* node, CNode* target);
  void ProcessNameAndHintNodes(CNode* name_node, CNode* hint_node, bool is_arg);
  // False: nothing known (the host's None).
  bool GetHintInfoStr(CNode* node, std::string& info);
  void AddSymInfo(Text name, Text istr, bool is_arg);

  // ---- signatures (signature_comments.cc) ----
  bool VisitFuncdefStmt(CNode* node);
  struct RewrittenHint {
    std::vector<std::string> tokens;
    std::vector<int64_t> utf8_offsets;
  };
  static RewrittenHint RewriteFuncdefCommentHint(Text hint);
  // `funcdef_logical` null: the comment stands on a line of its own in the body.
  void ProcessFuncdefComment(Text hint, int32_t tok_i, LogicalLine* funcdef_logical, bool is_arg);
  void ProcessArgSpecificComment(const CArgInfo& arg);
  CNode* ParseFuncdefCommentHint(Text hint, int32_t tok_i);

  int32_t fCommentHintCount = 0;
  CPGenParserImpl& hint_parser() const { return *hint_parser_; }
  CNodeWalker* general_node_walker() const { return general_node_walker_; }
  CNodeToTextConverter& name_conv() { return name_conv_; }
  CNodeToTextConverter& hint_conv() { return hint_conv_; }

 private:
  // A signature's tokens and, for each, its offset in the hint.
  struct Signature {
    std::vector<Token> tokens;
    std::vector<int64_t> utf8_offsets;
  };
  // `text` is kSignatureFront, the hint and a colon; the tokens are views into it.
  static Signature RewriteSignature(Text text);

  // The comments that may hold a hint, into fCommentHintCount.
  void CountCommentHints(LogicalLine& logical);
  void WalkTree(CNode* node, LogicalLine* logical, bool first_in_def, bool is_of_line);
  // ---- complete readings ----
  CNode* ParseHintCompletely(Text hint, int32_t tok_i, bool call_general_node_walker);
  CNode* ParseTokensCompletely(TokenSpan toks, int32_t tok_i, bool is_signature);
  void ProcessSignatureCompletely(Text hint, int32_t tok_i, LogicalLine* funcdef_logical, bool is_arg);
  void KeepHintError(int32_t tok_i, int64_t utf8_offset_in_hint, const std::string& message);
  static bool SaysIgnore(Text hint);
  std::vector<Token> TokensOfHint(Text hint);

  // Walks a tree that cannot reach a limit: statements alone, none of their expressions.
  void VisitStatements(CNode* node, int32_t depth);

  LogicalLine& RequireLogical() const;
  CNodeWalker& RequireGeneralWalker() const;
  // A copy of `text` that lives as long as the records of the line being walked.
  Text KeepText(Text text);
  void ProcessTargetWithHint(const Hint& hint, CNode* target);
  void ProcessNameAndHint(CNode* name_node, CNode* hint_node, bool is_arg, int depth);
  // Runs `use` and gives the tree of a hint back, whatever happens.
  template <class Use>
  void UseHintTree(CNode* node, Use&& use);

  CNodeToTextConverter name_conv_;
  CNodeToTextConverter hint_conv_;
  std::unique_ptr<CPGenParserImpl> hint_parser_;
  Version version_;
  CNodeWalker* general_node_walker_;
  Ref<SourceText> hint_source_;  // reused for the text of every hint
  std::vector<LineRow> hint_rows_;
  std::string info_buffer_;
  CompleteParser* complete_parser_ = nullptr;
  std::optional<SyntaxError> hint_error_;
  int64_t hint_column_ = 0;  // of the first token of the hint under way
};

template <class Use>
void CTypeHintWalker::UseHintTree(CNode* node, Use&& use) {
  try {
    use();
  } catch (...) {
    hint_parser_->DiscardNode(node);
    throw;
  }
  hint_parser_->DiscardNode(node);
}

}  // namespace quillet
