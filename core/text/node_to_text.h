// CNodeToTextConverter: the short, stable text of a node, or none where it has none in the mode
// asked for. For names, hints and equivalents; it is no source printer.
//
// Options at construction say how much detail to keep, those of a call what the caller accepts.
// Where the tokens of a text stand in the source as the text has them the result is a view of the
// source; any other text is composed in a buffer that belongs to the converter and is valid until
// its next call. The trap: a caller that keeps a text across calls copies it, unless it knows the
// text for a view. A nesting deeper than kMaxDepth is a RecursionError.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

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

  // None, or the node's text. AttributeError for a null node.
  Text TextForNode(CNode* node, TextOptions options = {}) {
    // Most texts asked for are those of a lone name.
    if (isa<CNameLiteral>(node) && node->IsLeaf() && !options.literal_only) return node->fText();
    return Render(node, options);
  }
  // The same for an atom with trailers; add_parens_if_operator plays no part.
  Text TextForAtomPlusTrailers(CNode* atom, std::span<CNode* const> trailers, TextOptions options = {});
  // What a trailer adds to the text of the chain in front of it; never none.
  Text TextForTrailer(CTrailer* trailer);
  // Never none.
  Text TextForStringLiteral(const CStringLiteral* node) const;
  // Whether a string is shown as it stands wherever contents of strings are shown.
  static bool ShowsContentsOf(Text string);

  // Whether a power is shown with its exponent, as a reader of all of a source wants it; hosts of the walkers
  // know it without.
  void set_shows_exponents(bool shows) { shows_exponents_ = shows; }

  bool include_bracket_text() const { return include_bracket_text_; }
  bool include_string_contents() const { return include_string_contents_; }
  bool include_arg_text() const { return include_arg_text_; }

 private:
  // A text while it grows: a view as long as each piece begins where the last one ended, and from
  // then on the end of buffer_.
  struct Run {
    const char* view = nullptr;
    size_t view_size = 0;
    size_t offset = 0;
    bool composed = false;
  };
  // The text of a child that waits to be joined with its siblings.
  struct Piece {
    const char* view;  // null: it stands in buffer_ at `offset`
    size_t offset;
    size_t size;
    TokenCode code;  // ERRORTOKEN: more than one token
  };

  Text Render(CNode* node, TextOptions options);
  void Begin();
  void Append(Run& run, Text piece) {
    if (!run.composed && run.view + run.view_size == piece.data()) {
      run.view_size += piece.size();
    } else {
      AppendApart(run, piece);
    }
  }
  // A first piece, or one that does not begin where the text ends.
  void AppendApart(Run& run, Text piece);
  void Compose(Run& run);
  Text TextOf(const Run& run) const;

  // Each appends to the run and is false for none; what it appended before is then the caller's to
  // undo, if it goes on.
  bool AppendNode(Run& run, CNode* node, TextOptions options);
  bool AppendLeaf(Run& run, const CNode* leaf, TextOptions options);
  bool AppendInterior(Run& run, CNode* node, TextOptions options);
  bool AppendCompound(Run& run, CNode* node, TextOptions options);
  bool AppendChain(Run& run, CNode* atom, std::span<CNode* const> trailers, TextOptions options);
  bool AppendPower(Run& run, CPower* power, CNode* exponent, TextOptions options);
  bool AppendTrailer(Run& run, CNode* trailer, bool dotted_name_only, bool literal_only);
  void AppendTrailerContents(Run& run, CNode* nested, bool literal_only);

  bool include_bracket_text_;
  bool include_string_contents_;
  bool include_arg_text_;
  bool shows_exponents_ = false;
  int depth_ = 0;
  // Kept from call to call for their memory.
  std::string buffer_;
  std::string joined_;
  std::vector<Piece> pieces_;
  std::vector<Text> texts_;
  std::vector<TokenCode> codes_;
};

}  // namespace quillet
