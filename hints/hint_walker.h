// CTypeHintWalker finds type information in a statement and records it on the logical line: from
// annotations, and from comments of the form "# type: ...".
//
// A comment's hint is text, so it is parsed here, with a parser of its own; the names in it are
// recorded by the general walker, whose walk of the statement has ended by then. A hint that does
// not parse is a SyntaxError at its column in the comment. Signature comments, "(int, str) -> bool",
// are in signature_comments.cc. A line without "type:" in a comment costs one pass over its token
// codes.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "hints/dispatch_walker.h"
#include "parser/parser.h"
#include "text/node_to_text.h"
#include "walker/walker.h"

namespace quillet {

class CTypeHintWalker : public CDispatchWalker {
 public:
  // `general_node_walker` may be null; it is not owned.
  CTypeHintWalker(std::unique_ptr<CPGenParserImpl> hint_parser, Version version, CNodeWalker* general_node_walker);

  void Walk(CNode* node, LogicalLine* logical, bool first_in_def) override;

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
  Hint FindEndingTypeComment(CNode* node);
  // False: no hint. The hint keeps each character at its column in the comment.
  static bool GetHintFromComment(Text comment, std::string& hint);
  std::pair<int32_t, int32_t> GetRowRange(CNode* node) const;
  Comment FindComment(int32_t row, LogicalLine* logical = nullptr) const;
  static bool IsDottedName(Text text);
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
  void ProcessFuncdefComment(Text hint, int32_t tok_i, LogicalLine* funcdef_logical, bool is_arg);
  void ProcessArgSpecificComment(const CArgInfo& arg);
  CNode* ParseFuncdefCommentHint(Text hint, int32_t tok_i);

  int32_t fCommentHintCount = 0;
  CPGenParserImpl& hint_parser() const { return *hint_parser_; }
  CNodeWalker* general_node_walker() const { return general_node_walker_; }

 private:
  CNodeToTextConverter name_conv_;
  CNodeToTextConverter hint_conv_;
  std::unique_ptr<CPGenParserImpl> hint_parser_;
  Version version_;
  CNodeWalker* general_node_walker_;
};

}  // namespace quillet
