// Flat lists out of the irregular places of the grammars: parameters, call arguments, imported
// names. The lists refer to nodes of the tree and are valid until it is discarded.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "foundations/errors.h"
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
// list of its own. Lists may be nested as deep as the source nests brackets: dropping one takes no
// machine stack, and a reader bounds its own descent.
struct ArgEntry {
  ArgEntry() = default;
  explicit ArgEntry(const CArgInfo& info) : arg(info) {}
  explicit ArgEntry(std::vector<ArgEntry> nested) : is_list(true), list(std::move(nested)) {}
  ArgEntry(ArgEntry&&) noexcept = default;
  ArgEntry& operator=(ArgEntry&&) noexcept = default;
  ~ArgEntry() {
    if (!list.empty()) [[unlikely]]
      DropNested(list);
  }

  CArgInfo arg;
  bool is_list = false;
  std::vector<ArgEntry> list;

 private:
  static void DropNested(std::vector<ArgEntry>& nested);
};

using ArgList = std::vector<ArgEntry>;      // of GetDefiningArgInfoList
using UsedArgList = std::vector<CArgInfo>;  // of GetUsedArgInfoList

// What stands for a parameter and is no name: an AssertionError that knows the node.
class NotANameError : public Error {
 public:
  NotANameError(std::string message, CNode* not_a_name)
      : Error(ErrorKind::kAssertionError, std::move(message)), node(not_a_name) {}
  CNode* node;
};

// Parameters of the node after `def name` or `lambda`. AssertionError for shapes that no grammar
// gives.
ArgList GetDefiningArgInfoList(CNode* node);
// The same into a list that is reused.
void GetDefiningArgInfoList(CNode* node, ArgList& out);
// Arguments of the inside of `value(...)`.
UsedArgList GetUsedArgInfoList(CNode* node);
// The same into a list that is reused.
void GetUsedArgInfoList(CNode* node, UsedArgList& out);
// The node itself, or its last child's last leaf.
const CNode* LastLeaf(const CNode* node);
// The token index just past the node. TypeError where its last leaf has no token index.
int64_t GetTokenEndIndex(const CNode* node);

// The dotted text of an import, pieces joined with nothing between.
std::string TextForImportName(std::span<CNode* const> nodes);
void AppendTextForImportName(std::span<CNode* const> nodes, std::string& out);
std::vector<CAsName> ProcessAsNamesList(CNode* node);
CAsName ProcessSingleModuleNameAs(CNode* node);
// Index of the first child with this text, -1 without one.
int32_t GetMatchingChildToken(const CNode* node, Text text);

// The parts of one imported name, for a caller who composes its text himself: the node of the dotted
// name and the text behind `as`, if any.
struct AsNameParts {
  CNode* module;
  Text as_name;
};
AsNameParts SplitSingleModuleNameAs(CNode* node);

// Calls `fn(AsNameParts)` for each entry of ProcessAsNamesList.
template <class Fn>
void ForEachAsName(CNode* node, Fn&& fn) {
  if (node == nullptr) [[unlikely]]
    ThrowNoAttribute("fText");
  // A bare name, one `a as b` or one `a.b` stands alone; only a list has a comma in second place.
  if (node->ChildCount() < 2 || !node->ChildIs(1, tok::COMMA)) return fn(SplitSingleModuleNameAs(node));
  for (CNode* child : node->fChildren()) {
    if (child == nullptr) [[unlikely]]
      ThrowNoAttribute("fText");
    if (child->code != tok::COMMA) fn(SplitSingleModuleNameAs(child));
  }
}

}  // namespace quillet
