// The parser engine: grammar tables, a stack of its own, and a builder that makes the nodes.
//
// Input depth never becomes machine-stack depth. The stack holds only frames that matter: entering
// an expression walks down a chain of rules at once, and the next token picks, in one lookup, the
// rule of the chain that takes it. Rules above it matched one child and vanish without a node; rules
// below stay as a prefix of the chain, interned, until their one child is there.
//
// A builder is a class with
//   using Node = ...;                                            a pointer-like value
//   Node Leaf(int type, const Token& token, int32_t context);    at a token's shift
//   Node Rule(int symbol, Node* children, uint32_t count);       at a rule's end, children in order
//   void Drop(Node node);                                        a node that a failed parse leaves
#pragma once

#include <cstdint>
#include <vector>

#include "foundations/errors.h"
#include "siblings/optpgen/grammar.h"

namespace quillet {

template <class Builder>
class Engine {
 public:
  using Node = typename Builder::Node;

  // `promote_single_child` false keeps rules of one child as nodes.
  Engine(const Grammar& grammar, Builder builder, bool promote_single_child = true);
  ~Engine();

  // Starts a new input; what a failed statement left on the stack is dropped.
  void Setup(int start_symbol);
  // ParseError with `context` where the token is not acceptable here (message "bad input") or is no
  // terminal of the grammar ("bad token"); "too much input" behind the end.
  void AddToken(Grammar::LabelId label, int type, const Token& token, int32_t context);
  // The root; ParseError where the input is not complete.
  Node Finish();

 private:
  // (tables and stack: owned by the one who writes this file's second half)
};

}  // namespace quillet
