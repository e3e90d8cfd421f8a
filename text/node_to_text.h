// CNodeToTextConverter: the short, stable text of a node, or none where it has none in the mode
// asked for. For names, hints and equivalents; it is no source printer.
//
// Options at construction say how much detail to keep, those of a call what the caller accepts.
// Where the tokens of a chain stand side by side in the source the result is a view into it; any
// other text is composed in a buffer that belongs to the converter and is valid until its next
// call. A nesting deeper than kMaxDepth is a RecursionError.
#pragma once

#include <span>
#include <string>

#include "tree/nodes.h"

namespace quillet {

struct TextOptions {
  bool dotted_name_only = false;
  bool discard_simple_parens = true;
  bool literal_only = false;
  bool add_parens_if_operator = false;
};

class CNodeToTextConverter {
 public:
  static constexpr int kMaxDepth = 400;

  explicit CNodeToTextConverter(bool include_bracket_text = false, bool include_string_contents = false,
                                bool include_arg_text = false)
      : include_bracket_text_(include_bracket_text),
        include_string_contents_(include_string_contents),
        include_arg_text_(include_arg_text) {}

  // None, or text that is stable (a view of the source or static) or stands in the converter's
  // buffer until the next call: see is_stable.
  Text TextForNode(CNode* node, TextOptions options = {});
  Text TextForAtomPlusTrailers(CNode* atom, std::span<CNode* const> trailers, TextOptions options = {});
  Text TextForStringLiteral(CNode* node);

  // Whether a result lives as long as the source it came from.
  bool is_stable(Text text) const {
    return text.data() < buffer_.data() || text.data() >= buffer_.data() + buffer_.capacity();
  }

  bool include_bracket_text() const { return include_bracket_text_; }
  bool include_string_contents() const { return include_string_contents_; }
  bool include_arg_text() const { return include_arg_text_; }

 private:
  bool include_bracket_text_;
  bool include_string_contents_;
  bool include_arg_text_;
  std::string buffer_;
};

}  // namespace quillet
