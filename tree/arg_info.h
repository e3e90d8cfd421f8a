// Flat lists out of the irregular places of the grammars: parameters, call arguments, imported
// names. The lists refer to nodes of the tree and are valid until it is discarded.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tree/node.h"

namespace quillet {

// One parameter, or one argument of a call.
struct CArgInfo {
  CNode* name = nullptr;       // the parameter's name, or the keyword of k=v
  CNode* value = nullptr;      // the default, or the argument's value
  Text prefix = kNoText;       // "*", "**" or none
  CNode* type_expr = nullptr;  // the annotation
};

// One imported name: the dotted name as written, and the name behind `as`.
struct CAsName {
  std::string module_name;
  bool has_as_name = false;
  std::string as_name;
};

// An entry of a list of parameters: a record, or, for a tuple parameter of the older grammar, a
// list of its own.
struct ArgEntry {
  CArgInfo arg;
  bool is_list = false;
  std::vector<ArgEntry> list;
};

using ArgList = std::vector<ArgEntry>;      // of GetDefiningArgInfoList
using UsedArgList = std::vector<CArgInfo>;  // of GetUsedArgInfoList

// Parameters of the node after `def name` or `lambda`. AssertionError for shapes that no grammar
// gives.
ArgList GetDefiningArgInfoList(CNode* node);
// Arguments of the inside of `value(...)`.
UsedArgList GetUsedArgInfoList(CNode* node);
// The same into a list that is reused.
void GetUsedArgInfoList(CNode* node, UsedArgList& out);
// The token index just past the node.
int64_t GetTokenEndIndex(const CNode* node);

// The dotted text of an import, pieces joined with nothing between.
std::string TextForImportName(std::span<CNode* const> nodes);
std::vector<CAsName> ProcessAsNamesList(CNode* node);
CAsName ProcessSingleModuleNameAs(CNode* node);
// Index of the first child with this text, -1 without one.
int32_t GetMatchingChildToken(const CNode* node, Text text);

}  // namespace quillet
