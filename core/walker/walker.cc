// The frame of a walk: one entry, the flush of the collected names, the recorders.
//
// Whatever leaves a walk, it leaves the walker idle. A limit that is reached, or any other
// RuntimeError, is printed and otherwise counts as success; what was recorded stays, while the reads
// and the stores inside sub-expressions, which are recorded at the end, are dropped.

#include "walker/walker.h"

#include <charconv>
#include <exception>

#include "foundations/console.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {
namespace {

// The kinds that are RuntimeErrors to the host, subclasses included.
bool IsRuntimeError(const Error& error) {
  return error.kind() == ErrorKind::kRuntimeError || error.kind() == ErrorKind::kRecursionError ||
         error.kind() == ErrorKind::kNotImplementedError;
}

}  // namespace

CNodeWalker::CNodeWalker(Version version)
    : fPy3(version.AtLeast(3, 0)), fToText(fIncludeExprText, fIncludeExprText, fIncludeExprText) {}

void CNodeWalker::Walk(CNode* node, LogicalLine* logical) {
  if (fLogical != nullptr || operations_ != 0) [[unlikely]]
    ThrowError(ErrorKind::kValueError, "Only one logical may be walked at a time");
  if (node == nullptr) return;
  operations_ = 1;
  met_doubtful_ = false;
  met_operator_text_ = false;
  fLogical = logical;
  // Names left over from operations by name are the walker's own.
  direct_ = own_texts_used_ ? nullptr : logical;
  fLoadNameContext = true;
  fStoreWithinSubExpr = false;
  if (const SourceText* source = logical != nullptr ? logical->source : nullptr) {
    source_begin_ = reinterpret_cast<uintptr_t>(source->begin());
    source_size_ = source->size();
  }

  struct AtEnd {
    CNodeWalker& walker;
    ~AtEnd() { walker.EndWalk(); }
  } at_end{*this};
  try {
    VisitNode(node);
    ProcessNamesFound(node);
  } catch (const Error& error) {
    if (!IsRuntimeError(error)) throw;
    PrintLine("RuntimeError raised in CNodeWalker.Walk: " + ReprOfException(std::current_exception()));
  }
}

void CNodeWalker::SetLogical(LogicalLine* logical) {
  fLogical = logical;
  direct_ = nullptr;
  source_begin_ = 0;
  source_size_ = 0;
  if (operations_ == 0 && own_texts_used_ && fLoadedNames.empty() && fStoredNames.empty()) {
    own_texts_used_ = false;
    own_texts_.Reset();
    composed_size_ = 0;
  }
}

void CNodeWalker::EndWalk() {
  fLogical = nullptr;
  direct_ = nullptr;
  operations_ = 0;
  fVisitCount = 0;
  fRecurseCount = 0;
  fLoadedNames.Clear();
  fStoredNames.Clear();
  source_begin_ = 0;
  source_size_ = 0;
  composed_size_ = 0;
  if (own_texts_used_) {
    own_texts_used_ = false;
    own_texts_.Reset();
  }
}

void CNodeWalker::ProcessNamesFound(CNode* node) {
  // What an import names is defined by its visit and must not read as a use.
  if (isa<CImportNamesStmt>(node) || isa<CFromImportStmt>(node)) return;
  if (fLoadedNames.empty() && fStoredNames.empty()) return;
  RequireLogical();
  for (const NameSet::Name& name : fLoadedNames.names()) {
    Assert(name.data != nullptr, "a name that was read has no text");
  }
  if (direct_ != nullptr && direct_->hooks == nullptr) {
    const NameSet::Name* const names = fLoadedNames.names().data();
    direct_->DirectAppendRows(fLoadedNames.size(), [names](size_t i) {
      return Record{names[i].data, kGetPrefix.data(), static_cast<uint32_t>(names[i].size), kPrefixLen};
    });
  } else {
    // A hook may call back and add names.
    for (size_t i = 0; i < fLoadedNames.size(); ++i) AddStableTypeEquiv(fLoadedNames[i], kGetPrefix);
  }
  for (size_t i = 0; i < fStoredNames.size(); ++i) {
    const Text name = fStoredNames.name(i);
    Assert(!IsNone(name), "a name that was stored has no text");
    StoreList::Store store = fStoredNames.first(i);
    while (true) {
      constexpr size_t kMaxDigits = 11;
      CountComposed(kPrefixLen + kMaxDigits);
      char* const info = Texts().Allocate(kPrefixLen + kMaxDigits);
      kWithinExprPrefix.copy(info, kPrefixLen);
      const char* end = std::to_chars(info + kPrefixLen, info + kPrefixLen + kMaxDigits, store.place).ptr;
      AddStableTypeEquiv(name, {info, static_cast<size_t>(end - info)});
      if (store.next == StoreList::kEnd) break;
      store = fStoredNames.at(store.next);
    }
  }
}

void CNodeWalker::RaiseIfNotInstance(const CNode* node, NodeKind cls) const {
  for (NodeKind kind = node != nullptr ? node->kind : NodeKind::kCNode;; kind = BaseOfNodeKind(kind)) {
    if (node != nullptr && kind == cls) return;
    if (kind == NodeKind::kCNode) break;
  }
  ThrowError(ErrorKind::kValueError, std::string("Node is not a <class 'quillet.tarvex.") + NameOfNodeKind(cls) +
                                         "'>: " + (node != nullptr ? ReprOfNode(node) : "None"));
}

// ---- texts that records refer to ----

Text CNodeWalker::KeepCopy(Text text) {
  CountComposed(text.size());
  return Texts().Copy(text);
}

void CNodeWalker::ThrowTooMuchText() {
  ThrowError(ErrorKind::kRuntimeError, "Maximum size of the texts of a statement exceeded");
}

// ---- recorders ----

void CNodeWalker::AddTypeEquiv(Text name, Text equiv) {
  if (direct_ == nullptr) [[unlikely]]
    return CopyTypeEquiv(name, equiv);
  direct_->AppendStableTypeEquiv(Keep(name), Keep(equiv));
}

void CNodeWalker::AddArgInfoBytes(Text name, Text info) {
  if (direct_ == nullptr) [[unlikely]]
    return CopyArgInfo(name, info);
  direct_->AppendStableArgTypeEquiv(Keep(name), Keep(info));
}

void CNodeWalker::CopyTypeEquiv(Text name, Text equiv) { RequireLogical().AppendTypeEquiv(name, equiv); }

void CNodeWalker::CopyArgInfo(Text name, Text info) { RequireLogical().AppendArgTypeEquiv(name, info); }

void CNodeWalker::AddNameDefined(Text name) { AddTypeEquiv(name, kSetPrefix); }

void CNodeWalker::AddArgNameDefined(Text name) { AddArgInfoBytes(name, kSetPrefix); }

}  // namespace quillet
