#include "inference/flow.h"

#include <algorithm>

namespace quillet {

bool ContinuesChain(StmtKind kind) {
  return kind == StmtKind::kElif || kind == StmtKind::kElse || kind == StmtKind::kExcept || kind == StmtKind::kFinally;
}

namespace {

// The last statement of a block that has any: the one around the last that begins in it.
StmtId LastOf(const FileSyntax& syntax, StmtId owner) {
  const auto behind = std::ranges::lower_bound(syntax.stmts.begin() + owner + 1, syntax.stmts.end(),
                                               syntax.stmt(owner).block_end, {}, &Stmt::begin);
  auto last = static_cast<StmtId>(behind - syntax.stmts.begin() - 1);
  while (last != owner && syntax.stmt(last).parent != owner) last = syntax.stmt(last).parent;
  if (last == owner) last = syntax.stmt(owner).first_child;
  while (syntax.stmt(last).next != kModuleStmt) last = syntax.stmt(last).next;
  return last;
}

// `blocks`: at the ends of how many blocks may be looked.
bool BlockLeaves(const FileSyntax& syntax, StmtId owner, bool counts_jumps, int& blocks) {
  if (syntax.stmt(owner).first_child == kModuleStmt || --blocks < 0) return false;
  const StmtId last = LastOf(syntax, owner);
  const Stmt& stmt = syntax.stmt(last);
  switch (stmt.kind) {
    case StmtKind::kReturn:
    case StmtKind::kRaise:
      return true;
    case StmtKind::kPass:
      return counts_jumps && (stmt.op == word::kBreak || stmt.op == word::kContinue);
    case StmtKind::kWith:
      return BlockLeaves(syntax, last, counts_jumps, blocks);
    case StmtKind::kElse: {
      StmtId clause = last;
      for (;;) {
        if (!BlockLeaves(syntax, clause, counts_jumps, blocks)) return false;
        const StmtKind kind = syntax.stmt(clause).kind;
        if (kind == StmtKind::kIf) return true;
        if (kind != StmtKind::kElse && kind != StmtKind::kElif) return false;
        clause = syntax.stmt(clause).previous;
        if (clause == kModuleStmt) return false;
      }
    }
    default:
      return false;
  }
}

}  // namespace

bool BlockLeaves(const FileSyntax& syntax, StmtId owner, bool counts_jumps) {
  int blocks = 4096;
  return BlockLeaves(syntax, owner, counts_jumps, blocks);
}

bool MayEnd(const FileSyntax& syntax, StmtId owner, const std::function<int(ExprId)>& truth,
            const std::function<bool(ExprId)>& returns) {
  const auto truth_of = [&](StmtId clause) {
    const auto exprs = syntax.ExprsOf(syntax.stmt(clause));
    return exprs.empty() ? -1 : truth(exprs[0]);
  };
  const auto ends = [&](StmtId clause) { return MayEnd(syntax, clause, truth, returns); };
  const auto is_left_by_break = [&](StmtId loop) {
    const Stmt& head = syntax.stmt(loop);
    for (StmtId id = loop + 1; id < syntax.stmts.size() && syntax.stmt(id).begin < head.block_end; ++id) {
      if (syntax.stmt(id).kind != StmtKind::kPass || syntax.stmt(id).op != word::kBreak) continue;
      StmtId around = syntax.stmt(id).parent;
      while (around != loop && syntax.stmt(around).kind != StmtKind::kFor &&
             syntax.stmt(around).kind != StmtKind::kWhile && around != kModuleStmt)
        around = syntax.stmt(around).parent;
      if (around == loop) return true;
    }
    return false;
  };
  for (StmtId id = syntax.stmt(owner).first_child; id != kModuleStmt; id = syntax.stmt(id).next) {
    const Stmt& stmt = syntax.stmt(id);
    const auto clauses = [&](auto&& visit) {
      for (StmtId at = stmt.next; at != kModuleStmt && ContinuesChain(syntax.stmt(at).kind); at = syntax.stmt(at).next)
        visit(at, syntax.stmt(at).kind);
    };
    switch (stmt.kind) {
      case StmtKind::kReturn:
      case StmtKind::kRaise:
        return false;
      case StmtKind::kPass:
        if (stmt.op == word::kBreak || stmt.op == word::kContinue) return false;
        break;
      case StmtKind::kAssert:
        if (truth_of(id) == 0) return false;
        break;
      case StmtKind::kExpression: {
        const auto exprs = syntax.ExprsOf(stmt);
        if (!exprs.empty() && !returns(exprs[0])) return false;
        break;
      }
      case StmtKind::kWith:
        if (!ends(id)) return false;
        break;
      case StmtKind::kIf: {
        bool is_decided = truth_of(id) == 1, may_end = truth_of(id) != 0 && ends(id);
        clauses([&](StmtId at, StmtKind kind) {
          const int holds = kind == StmtKind::kElse ? 1 : truth_of(at);
          may_end = may_end || (!is_decided && holds != 0 && ends(at));
          is_decided = is_decided || holds == 1;
        });
        if (is_decided && !may_end) return false;
        break;
      }
      case StmtKind::kWhile:
      case StmtKind::kFor: {
        bool may_end = stmt.kind == StmtKind::kFor || truth_of(id) != 1;
        clauses([&](StmtId at, StmtKind) { may_end = may_end && ends(at); });
        if (!may_end && !is_left_by_break(id)) return false;
        break;
      }
      case StmtKind::kTry: {
        bool may_end = ends(id), is_caught = false, is_over = false;
        clauses([&](StmtId at, StmtKind kind) {
          if (kind == StmtKind::kElse) may_end = may_end && ends(at);
          if (kind == StmtKind::kExcept) is_caught = is_caught || ends(at);
          if (kind == StmtKind::kFinally) is_over = !ends(at);
        });
        if (is_over || (!may_end && !is_caught)) return false;
        break;
      }
      case StmtKind::kMatch: {
        bool may_end = false, is_exhaustive = false;
        for (StmtId at = stmt.first_child; at != kModuleStmt; at = syntax.stmt(at).next) {
          may_end = may_end || ends(at);
          const auto exprs = syntax.ExprsOf(syntax.stmt(at));
          is_exhaustive = exprs.size() == 1 && syntax[exprs[0]].kind == ExprKind::kPatternCapture;
        }
        if (is_exhaustive && !may_end) return false;
        break;
      }
      default:
        break;
    }
  }
  return true;
}

Flow::Flow(const SourceFile& file, std::span<const uint32_t> bindings, const std::function<int(ExprId)>& truth)
    : file_(file), syntax_(file.syntax), bindings_(bindings), truth_(truth) {}

size_t Flow::FirstAt(uint32_t offset) const {
  return static_cast<size_t>(std::ranges::lower_bound(bindings_, offset) - bindings_.begin());
}

bool Flow::HasAny(uint32_t begin, uint32_t end) const {
  const size_t first = FirstAt(begin);
  return first < bindings_.size() && bindings_[first] < end;
}

void Flow::Add(uint32_t offset) {
  if (reached_->size() < kMaxBindings && std::ranges::find(*reached_, offset) == reached_->end())
    reached_->push_back(offset);
}

void Flow::All(uint32_t begin, uint32_t end) {
  for (size_t i = FirstAt(begin); i < bindings_.size() && bindings_[i] < end && reached_->size() < kMaxBindings; ++i)
    Add(bindings_[i]);
}

int Flow::TruthOf(StmtId clause) const {
  const auto exprs = syntax_.ExprsOf(syntax_.stmt(clause));
  return exprs.empty() ? -1 : truth_(exprs[0]);
}

StmtId Flow::HeadOfChain(StmtId stmt) {
  while (ContinuesChain(syntax_.stmt(stmt).kind) && syntax_.stmt(stmt).previous != kModuleStmt && MayLook())
    stmt = syntax_.stmt(stmt).previous;
  return stmt;
}

StmtId Flow::LastIn(StmtId owner, uint32_t end) const {
  const size_t behind = FirstAt(end);
  if (behind == 0) return kModuleStmt;
  const uint32_t offset = bindings_[behind - 1];
  const StmtId first = syntax_.stmt(owner).first_child;
  if (first == kModuleStmt) return kModuleStmt;
  for (StmtId at = syntax_.StatementAt(offset); at != kModuleStmt; at = syntax_.stmt(at).parent)
    if (syntax_.stmt(at).parent == owner)
      return offset >= syntax_.stmt(owner).end || owner == kModuleStmt ? at : kModuleStmt;
  return kModuleStmt;
}

// Decorators stand in front of their statement's begin.
uint32_t Flow::InFrontOf(StmtId head, uint32_t end) const {
  const size_t behind = FirstAt(end);
  return std::min(syntax_.stmt(head).begin, behind == 0 ? end : bindings_[behind - 1]);
}

bool Flow::Head(StmtId id, bool holds) {
  const Stmt& stmt = syntax_.stmt(id);
  return Bound(stmt.begin, stmt.end, UINT32_MAX, holds);
}

bool Flow::Bound(uint32_t begin, uint32_t end, uint32_t place, bool holds) {
  bool is_sure = false;
  for (size_t i = FirstAt(begin); i < bindings_.size() && bindings_[i] < end && MayLook(); ++i) {
    Add(bindings_[i]);
    is_sure = is_sure || IsSure(bindings_[i], place, holds);
  }
  return is_sure;
}

// What stands behind `and`, in a branch of `a if b else c` or in a comprehension's loop need not be evaluated.
bool Flow::IsSure(uint32_t binding, uint32_t place, bool holds) {
  const auto is_and = [&](ExprId expr) {
    return syntax_[expr].kind == ExprKind::kBoolean && syntax_[expr].op == word::kAnd;
  };
  for (ExprId expr = syntax_.NamedAt(binding); expr != kNoExpr; expr = syntax_[expr].parent) {
    const ExprId parent = syntax_[expr].parent;
    if (parent == kNoExpr) return true;
    if (!MayLook()) return false;
    const Expr& around = syntax_[parent];
    const bool holds_place = around.begin <= place && place < around.end;
    switch (around.kind) {
      case ExprKind::kConditional:
        if (syntax_.ChildOf(parent, 1) != expr) return false;
        break;
      case ExprKind::kBoolean: {
        if (holds_place || syntax_.ChildOf(parent, 0) == expr) break;
        // `a or b or c` is `(a or b) or c`.
        ExprId at = parent;
        for (ExprId up = syntax_[at].parent; syntax_[up].kind == ExprKind::kBoolean && syntax_[up].op == around.op &&
                                             syntax_.ChildOf(up, 0) == at && MayLook();
             up = syntax_[at].parent)
          at = up;
        if (syntax_[at].begin <= place && place < syntax_[at].end) return true;
        at = parent;
        while (holds && at != kNoExpr && is_and(at) && MayLook()) at = syntax_[at].parent;
        if (!holds || at != kNoExpr) return false;
        break;
      }
      case ExprKind::kCompare:
        if (!holds_place && syntax_.ChildOf(parent, 0) != expr && syntax_.ChildOf(parent, 1) != expr) return false;
        break;
      case ExprKind::kListComprehension:
      case ExprKind::kSetComprehension:
      case ExprKind::kDictComprehension:
      case ExprKind::kGenerator:
        if (!holds_place) return false;
        break;
      default:
        break;
    }
    if (holds_place) return true;
  }
  return true;
}

bool Flow::Leaves(StmtId owner) const { return BlockLeaves(syntax_, owner, true); }

// What a loop's jumps of one kind take along. Whether the variable is surely bound by the body in front of each.
bool Flow::Jumps(StmtId loop, uint16_t word, bool* has_any) {
  const Stmt& head = syntax_.stmt(loop);
  bool is_bound = true;
  for (StmtId id = loop + 1; id < syntax_.stmts.size() && syntax_.stmt(id).begin < head.block_end && MayLook(); ++id) {
    if (syntax_.stmt(id).kind != StmtKind::kPass || syntax_.stmt(id).op != word) continue;
    StmtId around = syntax_.stmt(id).parent;
    const auto is_around = [&](StmtKind kind) {
      return kind == StmtKind::kFor || kind == StmtKind::kWhile || kind == StmtKind::kDef || kind == StmtKind::kClass;
    };
    while (around != kModuleStmt && !is_around(syntax_.stmt(around).kind)) around = syntax_.stmt(around).parent;
    if (around != loop) continue;
    if (has_any != nullptr) *has_any = true;
    if (!Before(id, loop)) is_bound = false;
  }
  return is_bound;
}

// What comes back to a loop's beginning.
void Flow::BackEdges(StmtId loop) {
  const Stmt& head = syntax_.stmt(loop);
  if (!HasAny(head.end, head.block_end)) return;
  if (steps_-- <= 0) return All(head.end, head.block_end);
  BlockEnd(loop);
  Jumps(loop, word::kContinue);
}

Flow::Outcome Flow::BlockEnd(StmtId owner) {
  if (Leaves(owner)) return Outcome::kLeaves;
  uint32_t end = syntax_.stmt(owner).block_end;
  while (const StmtId last = MayLook() ? LastIn(owner, end) : kModuleStmt) {
    const StmtId head = HeadOfChain(last);
    if (Group(head) == Outcome::kAlways) return Outcome::kAlways;
    end = InFrontOf(head, end);
  }
  return Outcome::kMaybe;
}

Flow::Outcome Flow::Group(StmtId head) {
  const Stmt& stmt = syntax_.stmt(head);
  const auto clauses = [&](auto&& visit) {
    for (StmtId at = stmt.next; at != kModuleStmt && ContinuesChain(syntax_.stmt(at).kind) && MayLook();
         at = syntax_.stmt(at).next)
      visit(at, syntax_.stmt(at).kind);
  };
  switch (stmt.kind) {
    case StmtKind::kIf: {
      std::vector<StmtId> branches{head};
      clauses([&](StmtId at, StmtKind) { branches.push_back(at); });
      bool is_open = true;  // whether a run comes to the end with what it came with
      for (size_t i = 0; i < branches.size(); ++i) {
        if ((syntax_.stmt(branches[i]).kind == StmtKind::kElse ? 1 : TruthOf(branches[i])) != 1) continue;
        branches.resize(i + 1);
        is_open = false;
      }
      for (size_t i = branches.size(); i-- > 0;) {
        const bool is_else = syntax_.stmt(branches[i]).kind == StmtKind::kElse;
        if ((is_else || TruthOf(branches[i]) != 0) && BlockEnd(branches[i]) == Outcome::kMaybe &&
            !(HasAny(syntax_.stmt(branches[i]).begin, syntax_.stmt(branches[i]).end) && Head(branches[i], true)))
          is_open = true;
        if (is_open && Head(branches[i])) is_open = false;
      }
      return is_open ? Outcome::kMaybe : Outcome::kAlways;
    }
    case StmtKind::kFor:
    case StmtKind::kWhile: {
      bool has_else = false;
      clauses([&](StmtId, StmtKind) { has_else = true; });
      if (!has_else && !HasAny(stmt.begin, stmt.block_end)) return Outcome::kMaybe;
      if (steps_-- <= 0) {
        All(stmt.begin, stmt.block_end);
        clauses([&](StmtId at, StmtKind) { BlockEnd(at); });
        return Outcome::kMaybe;
      }
      // `while True` is left by a `break` in its body only.
      const bool is_endless = stmt.kind == StmtKind::kWhile && TruthOf(head) == 1;
      bool has_break = false;
      const bool is_broken_open = !Jumps(head, word::kBreak, &has_break);
      if (is_endless && !has_break) return BlockEnd(head) == Outcome::kMaybe ? Outcome::kMaybe : Outcome::kAlways;
      bool is_open = !is_endless;
      clauses([&](StmtId at, StmtKind) {
        if (!is_endless) is_open = BlockEnd(at) == Outcome::kMaybe;
      });
      if (!is_open && !is_broken_open) return Outcome::kAlways;
      BackEdges(head);
      const bool is_bound = Head(head);
      if (is_bound && (stmt.kind == StmtKind::kWhile || !is_open)) return Outcome::kAlways;
      return Outcome::kMaybe;
    }
    case StmtKind::kTry: {
      bool is_bound = false, has_else = false, is_open = false, is_caught = false;
      clauses([&](StmtId at, StmtKind kind) {
        if (kind == StmtKind::kFinally) is_bound = BlockEnd(at) != Outcome::kMaybe;
      });
      if (is_bound) return Outcome::kAlways;
      clauses([&](StmtId at, StmtKind kind) {
        if (kind == StmtKind::kExcept && BlockEnd(at) == Outcome::kMaybe) is_caught = true;
        if (kind == StmtKind::kElse) has_else = BlockEnd(at) != Outcome::kMaybe;
      });
      if (!has_else && BlockEnd(head) == Outcome::kMaybe) is_open = true;
      // A handler begins behind any statement of the body.
      if (is_caught) All(stmt.begin, stmt.block_end);
      return is_open || is_caught ? Outcome::kMaybe : Outcome::kAlways;
    }
    case StmtKind::kWith: {
      const Outcome body = BlockEnd(head);
      if (body == Outcome::kAlways) return body;
      return Head(head) ? Outcome::kAlways : Outcome::kMaybe;
    }
    case StmtKind::kMatch: {
      bool always = true, is_exhaustive = false;
      for (StmtId at = stmt.first_child; at != kModuleStmt && MayLook(); at = syntax_.stmt(at).next) {
        const bool in_head = Head(at);
        if (BlockEnd(at) == Outcome::kMaybe && !in_head) always = false;
        const auto exprs = syntax_.ExprsOf(syntax_.stmt(at));
        is_exhaustive = exprs.size() == 1 && syntax_[exprs[0]].kind == ExprKind::kPatternCapture;
      }
      return always && is_exhaustive ? Outcome::kAlways : Outcome::kMaybe;
    }
    case StmtKind::kDef:
    case StmtKind::kClass: {
      // The name, decorators and defaults; bindings in the block are those of a class body's assignment expressions.
      All(stmt.begin, stmt.end);
      return HasAny(stmt.name_begin, stmt.name_begin + 1) ? Outcome::kAlways : Outcome::kMaybe;
    }
    default:
      return Head(head) ? Outcome::kAlways : Outcome::kMaybe;
  }
}

// What binds between the beginning of a clause's chain and its block, where the place is in that block.
bool Flow::Above(StmtId clause) {
  const StmtKind kind = syntax_.stmt(clause).kind;
  if (kind == StmtKind::kFor || kind == StmtKind::kWhile) BackEdges(clause);
  return Head(clause, true) || Chain(clause);
}

// The same for the clauses in front of one of its chain.
bool Flow::Chain(StmtId clause) {
  const StmtKind own = syntax_.stmt(clause).kind;
  if (!ContinuesChain(own)) return false;
  for (StmtId at = clause;
       ContinuesChain(syntax_.stmt(at).kind) && syntax_.stmt(at).previous != kModuleStmt && MayLook();) {
    at = syntax_.stmt(at).previous;
    const Stmt& other = syntax_.stmt(at);
    switch (other.kind) {
      case StmtKind::kIf:
      case StmtKind::kElif:
        if (Head(at)) return true;
        break;
      case StmtKind::kFor:
        BackEdges(at);
        Head(at);
        break;
      case StmtKind::kWhile:
        BackEdges(at);
        if (Head(at)) return true;
        break;
      case StmtKind::kTry:
        if (own == StmtKind::kElse && BlockEnd(at) == Outcome::kAlways) return true;
        if (own != StmtKind::kElse) All(other.begin, other.block_end);
        break;
      default:
        if (own == StmtKind::kFinally) All(other.begin, other.block_end);
        break;
    }
  }
  return false;
}

bool Flow::Before(StmtId stmt, StmtId top) {
  for (;;) {
    const StmtId owner = syntax_.stmt(stmt).parent;
    uint32_t end = syntax_.stmt(HeadOfChain(stmt)).begin;
    while (const StmtId last = MayLook() ? LastIn(owner, end) : kModuleStmt) {
      const StmtId head = HeadOfChain(last);
      if (Group(head) == Outcome::kAlways) return true;
      end = InFrontOf(head, end);
    }
    if (owner == top || owner == kModuleStmt) return false;
    if (syntax_.stmt(owner).kind != StmtKind::kClass && Above(owner)) return true;
    stmt = owner;
  }
}

bool Flow::Reach(uint32_t offset, StmtId top, std::vector<uint32_t>& reached) {
  reached_ = &reached;
  steps_ = kMaxLoops;
  const StmtId at = syntax_.StatementAt(offset);
  bool is_bound = false;
  if (at != kModuleStmt && at != top) {
    const Stmt& stmt = syntax_.stmt(at);
    // A name that its own statement binds in front of it: by `:=`, the target of a `with` or of a comprehension's
    // loop. What stands in the head of a `for` is evaluated before its target is bound.
    const uint32_t end = std::min(offset, stmt.end);
    if (stmt.kind != StmtKind::kAssign && stmt.kind != StmtKind::kAugmentedAssign && stmt.kind != StmtKind::kFor &&
        stmt.kind != StmtKind::kAnnotated && stmt.kind != StmtKind::kDef && stmt.kind != StmtKind::kClass) {
      is_bound = Bound(stmt.begin, end, offset);
    } else {
      for (size_t i = FirstAt(stmt.begin); i < bindings_.size() && bindings_[i] < end && MayLook(); ++i) {
        const ExprId named = syntax_.NamedAt(bindings_[i]);
        if (named == kNoExpr || syntax_[syntax_[named].parent].kind != ExprKind::kNamed) continue;
        is_bound = Bound(bindings_[i], bindings_[i] + 1, offset) || is_bound;
      }
    }
    if (!is_bound && stmt.kind == StmtKind::kWhile) BackEdges(at);
    is_bound = is_bound || Chain(at) || Before(at, top);
  }
  return End(is_bound, offset, reached);
}

bool Flow::End(bool is_bound, uint32_t end, std::vector<uint32_t>& reached) {
  if (looks_ > kMaxLooks) {
    for (size_t i = FirstAt(end); i-- > 0 && reached.size() < kMaxBindings;) Add(bindings_[i]);
    is_bound = false;
  }
  std::ranges::sort(reached);
  return is_bound;
}

bool Flow::ReachEnd(StmtId top, std::vector<uint32_t>& reached) {
  reached_ = &reached;
  steps_ = kMaxLoops;
  uint32_t end = top == kModuleStmt ? static_cast<uint32_t>(file_.source->size()) + 1 : syntax_.stmt(top).block_end;
  bool is_bound = false;
  while (const StmtId last = MayLook() ? LastIn(top, end) : kModuleStmt) {
    const StmtId head = HeadOfChain(last);
    if (Group(head) == Outcome::kAlways) {
      is_bound = true;
      break;
    }
    end = InFrontOf(head, end);
  }
  return End(is_bound, UINT32_MAX, reached);
}

}  // namespace quillet
