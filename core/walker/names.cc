// What a name means where it is met: a read, a store inside a sub-expression, or nothing, where a
// binding records it.
//
// A chain is read link by link: a.b.c reads a, a.b and a.b.c, each as a name of its own. Every link
// but the last is read even where the chain is stored to, since a and a.b must be there for
// a.b.c = 1. The trap is the length of a chain: its text is put together once, as the walk goes
// along it, and every link is the beginning of the next.

#include "walker/chain_text.h"
#include "walker/walker.h"

namespace quillet {
namespace {

// Sets a value and puts the old one back, on whatever way out.
template <class T>
class Restored {
 public:
  Restored(T& value, T inside) : value_(value), before_(value) { value = inside; }
  ~Restored() { value_ = before_; }
  Restored(const Restored&) = delete;
  Restored& operator=(const Restored&) = delete;

 private:
  T& value_;
  T before_;
};

// `.name`, and no keyword behind the dot.
bool IsAttribute(const CNode* node) {
  return isa<CTrailer>(node) && node->child_count == 2 && node->ChildIs(0, tok::DOT) &&
         isa<CNameLiteral>(node->children[1]);
}

}  // namespace

// The links of one chain on their way by: texts, and how much of the chain is a dotted name.
class CNodeWalker::Chain {
 public:
  // `view`, where there is one, is the text of the chain up to trailer `start`.
  Chain(CNodeWalker& walker, CNode* atom, std::span<CNode* const> trailers, size_t start, Text view)
      : walker_(walker), atom_(atom), trailers_(trailers), done_(start), started_(!IsNone(view)) {
    if (started_) text_.StartWithView(view);
  }

  // The text up to and including trailer `i`, or none. `i` never goes down from call to call.
  Text LinkText(size_t i) {
    if (!started_) Start();
    if (!has_text_) return kNoText;
    TextArena& texts = walker_.Texts();
    const bool was_composed = text_.composed();
    const size_t size_before = text_.text().size();
    for (; done_ <= i; ++done_) {
      auto* trailer = cast<CTrailer>(trailers_[done_]);
      if (IsAttribute(trailer)) {
        text_.Append(trailer->children[0]->fText(), texts);
        text_.Append(trailer->children[1]->fText(), texts);
      } else {
        text_.Append(walker_.fToText.TextForTrailer(trailer), texts);
      }
    }
    if (text_.composed()) walker_.CountComposed(text_.text().size() - (was_composed ? size_before : 0));
    return text_.text();
  }
  // Whether the texts of the links last as long as the line's records.
  bool lasting() const { return text_.composed() || walker_.InSource(text_.text()); }

  // The dotted name in front of trailer `i`, kept, or none: asked for at a call, and only where all
  // trailers in front are attributes.
  Text DottedName(size_t i) {
    if (isa<CNameLiteral>(atom_) && done_ == i && started_) {
      return text_.composed() ? text_.text() : walker_.Keep(text_.text());
    }
    const Text name = walker_.fToText.TextForAtomPlusTrailers(atom_, trailers_.first(i), {.dotted_name_only = true});
    return IsNone(name) ? kNoText : walker_.Keep(name);
  }

 private:
  void Start() {
    started_ = true;
    const Text text = walker_.fToText.TextForNode(atom_, {.discard_simple_parens = false});
    has_text_ = !IsNone(text);
    if (!has_text_) return;
    if (text.data() == atom_->text || walker_.InSource(text)) {
      text_.StartWithView(text);
    } else {
      text_.StartWithCopy(text, walker_.Texts());
    }
  }

  CNodeWalker& walker_;
  CNode* atom_;
  std::span<CNode* const> trailers_;
  ChainText text_;
  size_t done_;  // trailers that text_ holds, once it has been started
  bool started_;
  bool has_text_ = true;
};

// ---- context ----

void CNodeWalker::VisitStoreContextNode(CNode* node, bool within_sub_expr) {
  const Restored load(fLoadNameContext, false);
  const Restored store(fStoreWithinSubExpr, within_sub_expr);
  VisitNode(node);
}

void CNodeWalker::VisitLoadContextNode(CNode* node) {
  const Restored load(fLoadNameContext, true);
  VisitNode(node);
}

// ---- single names ----

inline Text CNodeWalker::AddLoadedName(Text name, bool lasting, Text previous) {
  const NameSet::Place place = fLoadedNames.Add(name, previous);
  if (!lasting && place.added && !IsNone(name)) fLoadedNames.Replace(place.index, Keep(name));
  return fLoadedNames[place.index];
}

void CNodeWalker::AddStoredName(const CNode* node, Text text, bool lasting) {
  // A place is a token index. Leaves of patterns carry positions, but no pattern is walked in store
  // context; what a host built otherwise fails as its conversion to digits would.
  if (!node->fContext.IsIndex()) ThrowError(ErrorKind::kTypeError, "an integer is required");
  const NameSet::Place place = fStoredNames.Add(text, node->fContext.value);
  if (place.added && !lasting) fStoredNames.Replace(place.index, Keep(text));
}

inline Text CNodeWalker::ProcessName(const CNode* node, Text text, bool more, bool lasting, Text previous) {
  if (more || fLoadNameContext) return AddLoadedName(text, lasting, previous);
  if (fStoreWithinSubExpr) AddStoredName(node, text, lasting);
  return kNoText;
}

void CNodeWalker::ProcessLoadName(Text name) { AddLoadedName(name, /*lasting=*/false, kNoText); }

void CNodeWalker::VisitNameLiteral(CNode* node, CNode* atom_node, std::span<CNode* const> all_trailers,
                                   int64_t trailer_i, bool has_trailers) {
  if (node == nullptr) ThrowNoAttribute("fText");
  if (!IsName(node)) return;
  Text text = node->fText();
  bool more = false;
  if (has_trailers) {
    const auto count = static_cast<int64_t>(all_trailers.size());
    more = trailer_i + 1 < count;
    if (trailer_i >= 0) {
      const auto links = static_cast<size_t>(more ? trailer_i + 1 : count);
      text = fToText.TextForAtomPlusTrailers(atom_node, all_trailers.first(links));
      if (IsNone(text)) return;
    }
  }
  ProcessName(node, text, more, /*lasting=*/false);
}

void CNodeWalker::VisitDottedName(CDottedName* node) {
  ChainText chain;
  TextArena& texts = Texts();
  Text previous = kNoText;
  for (uint32_t i = 0; i < node->child_count; ++i) {
    const CNode* child = node->children[i];
    if (child == nullptr || !child->IsLeaf()) ThrowError(ErrorKind::kTypeError, "a part of a dotted name has no text");
    if (i == 0) {
      chain.StartWithView(child->fText());
    } else {
      chain.Append(child->fText(), texts);
    }
    // A dotted name is read in any context.
    if (i % 2 == 0) {
      previous = AddLoadedName(chain.text(), chain.composed() || InSource(chain.text()), previous);
    }
  }
  if (chain.composed()) CountComposed(chain.text().size());
}

// ---- chains ----

void CNodeWalker::VisitPower(CPower* node) {
  VisitAtomPlusTrailers(node->GetAtom(), node->TrailerSpan());
  if (CNode* exponent = node->GetExponentNode()) VisitNode(exponent);
}

void CNodeWalker::VisitAtomExpr(CAtomExpr* node) {
  // An await in front plays no part.
  VisitAtomPlusTrailers(node->GetAtom(), node->TrailerSpan());
}

void CNodeWalker::VisitAtomPlusTrailers(CNode* atom_node, std::span<CNode* const> all_trailers) {
  const size_t count = all_trailers.size();
  if (!isa<CNameLiteral>(atom_node)) {
    VisitNode(atom_node);
    return VisitTrailers(atom_node, all_trailers, 0, kNoText);
  }
  const char* const begin = atom_node->text;
  const char* end = begin + atom_node->text_length;
  const bool lasting = InSource(atom_node->fText());
  Text previous = kNoText;
  if (IsName(atom_node)) previous = ProcessName(atom_node, atom_node->fText(), count > 0, lasting);

  // Attributes that stand side by side in the source: the text of each is a longer view.
  size_t i = 0;
  for (; i < count; ++i) {
    const CNode* const trailer = all_trailers[i];
    if (!IsAttribute(trailer)) break;
    const CNode* const dot = trailer->children[0];
    const CNode* const name = trailer->children[1];
    if (dot->text != end || name->text != end + 1 || !IsName(name)) break;
    end = name->text + name->text_length;
    previous = ProcessName(name, {begin, static_cast<size_t>(end - begin)}, i + 1 < count, lasting, previous);
  }
  if (i < count) VisitTrailers(atom_node, all_trailers, i, {begin, static_cast<size_t>(end - begin)});
}

// The trailers from `start` on, where `view` is the text of the chain in front of them, or none
// where there is nothing in front but an atom that is no name.
void CNodeWalker::VisitTrailers(CNode* atom_node, std::span<CNode* const> all_trailers, size_t start, Text view) {
  const size_t count = all_trailers.size();
  const Restored deeper(fRecurseCount, fRecurseCount + depth_of_trailers_);
  Chain chain(*this, atom_node, all_trailers, start, view);
  Text previous = kNoText;  // the text of the last link that was read, as it is kept
  bool dotted = true;       // all trailers up to here are attributes
  for (size_t i = start; i < count; ++i) {
    auto* trailer = Expect<CTrailer>(all_trailers[i]);
    if (trailer == nullptr) ThrowNoAttribute("GetInitialToken");
    if (trailer->child_count == 0) (void)trailer->GetInitialToken();
    CNode* const child = trailer->ChildAt(1);
    const bool is_attribute = trailer->ChildIs(0, tok::DOT);
    if (is_attribute && isa<CNameLiteral>(child)) {
      const bool more = i + 1 < count;
      // The last link of a chain that is stored to is the business of its binding.
      if (IsName(child) && (more || fLoadNameContext || fStoreWithinSubExpr)) {
        const Text text = chain.LinkText(i);
        if (!IsNone(text)) previous = ProcessName(child, text, more, chain.lasting(), previous);
      }
    } else if (trailer->ChildIs(0, tok::LPAR) && trailer->child_count == 3) {
      // Empty parentheses are no call here: they tell nothing about the callee.
      const Restored load(fLoadNameContext, fLoadNameContext || is_complete_);
      ProcessCallOf(dotted ? chain.DottedName(i) : kNoText, child);
    } else if (trailer->ChildIs(0, tok::LSQB) || trailer->ChildIs(0, tok::LBRACE)) {
      VisitLoadContextNode(child);
    } else if (!trailer->ChildIs(1, tok::RPAR) || child->child_count != 0) {
      VisitNode(child);
    } else {
      CountVisit();
    }
    dotted = dotted && is_attribute;
  }
}

// ---- comprehensions ----

void CNodeWalker::VisitCompForNode(CCompForNode* node) {
  // Targets live in the scope of the comprehension. The element in front of the clause was walked
  // before it, so the names bound here also count as read.
  if (is_complete_) {
    DoubtTarget(node->GetTargetNode());
    DoubtElement(node);
  }
  VisitStoreContextNode(node->GetTargetNode(), /*within_sub_expr=*/true);
  VisitNode(node->GetInNode());
  if (CNode* iter = node->GetCompIterNode()) VisitNode(iter);
}

}  // namespace quillet
