// The engine of a parser: grammar tables that build the nodes of a factory.
#pragma once

#include "grammar/engine.h"
#include "tree/factory.h"

namespace quillet {

struct FactoryBuilder {
  using Node = CNode*;
  CNodeFactory* factory;

  Node Leaf(int type, const Token& token, int32_t context) { return factory->ConvertToken(type, token, context); }
  Node Rule(int symbol, Node* children, uint32_t count) { return factory->ConvertRule(symbol, children, count); }
  void Drop(Node node) { factory->pool().Reclaim(node); }
};

using FactoryEngine = Engine<FactoryBuilder>;

}  // namespace quillet
