// The names in import statements, as written.
//
// A dotted name is one node or, where it is a single word, a bare leaf; the dots of a relative import
// are leaves beside it. So a name's text is the texts of all its leaves with nothing between.
#include "tree/arg_info.h"
#include "tree/nodes.h"

namespace quillet {

namespace {

// A name has one level. A host's tree may have more, but not without end.
constexpr uint32_t kMaxNameDepth = 250'000;

}  // namespace

void AppendTextForImportName(NodeSpan nodes, std::string& out) {
  struct Unread {
    NodeSpan nodes;
    uint32_t depth;
  };
  std::vector<Unread> around;
  uint32_t depth = 0;
  while (true) {
    while (!nodes.empty()) {
      const CNode* node = nodes.front();
      if (node == nullptr) ThrowNoAttribute("fText");
      nodes = nodes.subspan(1);
      if (node->IsLeaf()) {
        out += node->fText();
      } else if (node->child_count != 0) {
        if (!nodes.empty()) around.push_back({nodes, depth});
        if (++depth > kMaxNameDepth) ThrowTooDeep();
        nodes = node->fChildren();
      }
    }
    if (around.empty()) return;
    nodes = around.back().nodes;
    depth = around.back().depth;
    around.pop_back();
  }
}

std::string TextForImportName(NodeSpan nodes) {
  std::string text;
  AppendTextForImportName(nodes, text);
  return text;
}

int32_t GetMatchingChildToken(const CNode* node, Text text) {
  for (uint32_t i = 0; i < node->child_count; ++i) {
    if (node->children[i] == nullptr) ThrowNoAttribute("fText");
    const Text child_text = node->children[i]->fText();
    if (!IsNone(child_text) && child_text == text) return static_cast<int32_t>(i);
  }
  return -1;
}

AsNameParts SplitSingleModuleNameAs(CNode* node) {
  if (node == nullptr) [[unlikely]]
    ThrowNoAttribute("fText");
  if (node->child_count == 3 && node->ChildIs(1, word::kAs)) return {node->children[0], node->GetChildText(2)};
  return {node, kNoText};
}

namespace {

CAsName NameOf(const AsNameParts& parts) {
  return {TextForImportName({&parts.module, 1}), !IsNone(parts.as_name), std::string(parts.as_name)};
}

}  // namespace

CAsName ProcessSingleModuleNameAs(CNode* node) { return NameOf(SplitSingleModuleNameAs(node)); }

std::vector<CAsName> ProcessAsNamesList(CNode* node) {
  std::vector<CAsName> names;
  ForEachAsName(node, [&](const AsNameParts& parts) { names.push_back(NameOf(parts)); });
  return names;
}

std::vector<CAsName> CImportNamesStmt::GetAsNameList() const { return ProcessAsNamesList(GetNamesNode()); }

int32_t CFromImportStmt::GetImportIndex() const {
  for (uint32_t i = 0; i < child_count; ++i) {
    if (ChildIs(i, word::kImport)) return static_cast<int32_t>(i);
  }
  return -1;
}

NodeSpan CFromImportStmt::FromNodes() const {
  const int32_t import_index = GetImportIndex();
  return import_index < 2 ? NodeSpan() : fChildren().subspan(1, static_cast<size_t>(import_index) - 1);
}

std::string CFromImportStmt::GetFromString() const { return TextForImportName(FromNodes()); }

bool CFromImportStmt::GetImportStar() const { return child_count >= 3 && ChildAtIs(-1, tok::STAR); }

CNode* CFromImportStmt::GetNamesNode() const {
  const int32_t import_index = GetImportIndex();
  return ChildAt(import_index + (ChildAtIs(import_index + 1, tok::LPAR) ? 2 : 1));
}

std::vector<CAsName> CFromImportStmt::GetAsNameList() const { return ProcessAsNamesList(GetNamesNode()); }

}  // namespace quillet
