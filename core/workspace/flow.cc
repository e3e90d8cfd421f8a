#include "workspace/flow.h"

#include <algorithm>

namespace quillet {

bool ContinuesChain(StmtKind kind) {
  return kind == StmtKind::kElif || kind == StmtKind::kElse || kind == StmtKind::kExcept || kind == StmtKind::kFinally;
}

bool BlockLeaves(const FileSyntax& syntax, StmtId owner, bool counts_jumps) {
  StmtId last = syntax.stmt(owner).first_child;
  if (last == kModuleStmt) return false;
  while (syntax.stmt(last).next != kModuleStmt) last = syntax.stmt(last).next;
  const Stmt& stmt = syntax.stmt(last);
  switch (stmt.kind) {
    case StmtKind::kReturn:
    case StmtKind::kRaise:
      return true;
    case StmtKind::kPass:
      return counts_jumps && (stmt.op == word::kBreak || stmt.op == word::kContinue);
    case StmtKind::kWith:
      return BlockLeaves(syntax, last, counts_jumps);
    case StmtKind::kElse: {
      StmtId clause = last;
      for (;;) {
        if (!BlockLeaves(syntax, clause, counts_jumps)) return false;
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
  for (size_t i = FirstAt(begin); i < bindings_.size() && bindings_[i] < end; ++i) Add(bindings_[i]);
}

int Flow::TruthOf(StmtId clause) const {
  const auto exprs = syntax_.ExprsOf(syntax_.stmt(clause));
  return exprs.empty() ? -1 : truth_(exprs[0]);
}

StmtId Flow::HeadOfChain(StmtId stmt) const {
  while (ContinuesChain(syntax_.stmt(stmt).kind) && syntax_.stmt(stmt).previous != kModuleStmt)
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

bool Flow::Head(StmtId id) {
  const Stmt& stmt = syntax_.stmt(id);
  if (!HasAny(stmt.begin, stmt.end)) return false;
  All(stmt.begin, stmt.end);
  return true;
}

bool Flow::Leaves(StmtId owner) const { return BlockLeaves(syntax_, owner, false); }

Flow::Outcome Flow::BlockEnd(StmtId owner) {
  if (Leaves(owner)) return Outcome::kLeaves;
  uint32_t end = syntax_.stmt(owner).block_end;
  while (const StmtId last = LastIn(owner, end)) {
    const StmtId head = HeadOfChain(last);
    if (Group(head) == Outcome::kAlways) return Outcome::kAlways;
    end = InFrontOf(head, end);
  }
  return Outcome::kMaybe;
}

Flow::Outcome Flow::Group(StmtId head) {
  const Stmt& stmt = syntax_.stmt(head);
  const auto clauses = [&](auto&& visit) {
    for (StmtId at = stmt.next; at != kModuleStmt && ContinuesChain(syntax_.stmt(at).kind); at = syntax_.stmt(at).next)
      visit(at, syntax_.stmt(at).kind);
  };
  switch (stmt.kind) {
    case StmtKind::kIf: {
      bool has_else = false, always = true;
      const auto branch = [&](StmtId at) {
        Head(at);
        if (BlockEnd(at) == Outcome::kMaybe) always = false;
      };
      const int truth = TruthOf(head);
      if (truth != 0) branch(head);
      bool is_decided = truth == 1;
      clauses([&](StmtId at, StmtKind kind) {
        if (is_decided) return;
        const int own = kind == StmtKind::kElse ? 1 : TruthOf(at);
        if (own != 0) branch(at);
        if (own == 1) is_decided = true;
      });
      has_else = is_decided;
      return has_else && always ? Outcome::kAlways : Outcome::kMaybe;
    }
    case StmtKind::kFor:
    case StmtKind::kWhile: {
      // `while True` is left by a `break` in its body only.
      const bool always = stmt.kind == StmtKind::kWhile && TruthOf(head) == 1;
      Head(head);
      const Outcome body = BlockEnd(head);
      clauses([&](StmtId at, StmtKind) { BlockEnd(at); });
      return always && body == Outcome::kAlways ? Outcome::kAlways : Outcome::kMaybe;
    }
    case StmtKind::kTry: {
      bool body = BlockEnd(head) != Outcome::kMaybe, handlers = true, finally = false;
      clauses([&](StmtId at, StmtKind kind) {
        const Outcome outcome = BlockEnd(at);
        if (kind == StmtKind::kFinally) finally = outcome == Outcome::kAlways;
        if (kind == StmtKind::kExcept && outcome == Outcome::kMaybe) handlers = false;
        if (kind == StmtKind::kElse && outcome != Outcome::kMaybe) body = true;
      });
      return (body && handlers) || finally ? Outcome::kAlways : Outcome::kMaybe;
    }
    case StmtKind::kWith: {
      const Outcome body = BlockEnd(head);
      if (body == Outcome::kAlways) return body;
      return Head(head) ? Outcome::kAlways : Outcome::kMaybe;
    }
    case StmtKind::kMatch: {
      bool always = true, is_exhaustive = false;
      for (StmtId at = stmt.first_child; at != kModuleStmt; at = syntax_.stmt(at).next) {
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
  const Stmt& stmt = syntax_.stmt(clause);
  switch (stmt.kind) {
    case StmtKind::kFor:
    case StmtKind::kWhile:
      if (stmt.first_child != kModuleStmt) {
        std::vector<uint32_t>* const all = reached_;
        BlockEnd(clause);
        // What a `continue` comes from reaches the beginning as well.
        All(stmt.end, stmt.block_end);
        reached_ = all;
      }
      return Head(clause);
    case StmtKind::kElif:
    case StmtKind::kExcept:
    case StmtKind::kElse:
    case StmtKind::kFinally: {
      if (Head(clause)) return true;
      const StmtId head = HeadOfChain(clause);
      for (StmtId at = head; at != clause && at != kModuleStmt; at = syntax_.stmt(at).next) {
        const StmtKind kind = syntax_.stmt(at).kind;
        const Stmt& other = syntax_.stmt(at);
        if (kind == StmtKind::kIf || kind == StmtKind::kElif) {
          Head(at);
        } else if (kind == StmtKind::kTry) {
          if (stmt.kind == StmtKind::kElse && BlockEnd(at) == Outcome::kAlways) return true;
          if (stmt.kind != StmtKind::kElse) All(other.begin, other.block_end);
        } else if (stmt.kind == StmtKind::kFinally || kind == StmtKind::kFor || kind == StmtKind::kWhile) {
          All(other.begin, other.block_end);
        }
      }
      return false;
    }
    default:
      return Head(clause);
  }
}

bool Flow::Before(StmtId stmt, StmtId top) {
  for (;;) {
    const StmtId owner = syntax_.stmt(stmt).parent;
    uint32_t end = syntax_.stmt(HeadOfChain(stmt)).begin;
    while (const StmtId last = LastIn(owner, end)) {
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
  const StmtId at = syntax_.StatementAt(offset);
  bool is_bound = false;
  if (at != kModuleStmt && at != top) {
    const Stmt& stmt = syntax_.stmt(at);
    // A name that its own statement binds in front of it: by `:=`, the target of a `with` or of a comprehension's
    // loop. What stands in the head of a `for` is evaluated before its target is bound.
    if (stmt.kind != StmtKind::kAssign && stmt.kind != StmtKind::kAugmentedAssign && stmt.kind != StmtKind::kFor &&
        stmt.kind != StmtKind::kAnnotated && stmt.kind != StmtKind::kDef && stmt.kind != StmtKind::kClass) {
      All(stmt.begin, std::min(offset, stmt.end));
    } else {
      for (size_t i = FirstAt(stmt.begin); i < bindings_.size() && bindings_[i] < std::min(offset, stmt.end); ++i) {
        const ExprId named = syntax_.NamedAt(bindings_[i]);
        if (named != kNoExpr && syntax_[syntax_[named].parent].kind == ExprKind::kNamed) Add(bindings_[i]);
      }
    }
    if (ContinuesChain(stmt.kind)) {
      const StmtId head = HeadOfChain(at);
      if (syntax_.stmt(head).kind == StmtKind::kTry) All(syntax_.stmt(head).begin, syntax_.stmt(head).block_end);
      for (StmtId clause = head; clause != at && clause != kModuleStmt; clause = syntax_.stmt(clause).next)
        Head(clause);
    } else if (stmt.kind == StmtKind::kWhile) {
      All(stmt.end, stmt.block_end);
    }
    is_bound = Before(at, top);
  }
  std::ranges::sort(reached);
  return is_bound;
}

bool Flow::ReachEnd(StmtId top, std::vector<uint32_t>& reached) {
  reached_ = &reached;
  uint32_t end = top == kModuleStmt ? static_cast<uint32_t>(file_.source->size()) + 1 : syntax_.stmt(top).block_end;
  bool is_bound = false;
  while (const StmtId last = LastIn(top, end)) {
    const StmtId head = HeadOfChain(last);
    if (Group(head) == Outcome::kAlways) {
      is_bound = true;
      break;
    }
    end = InFrontOf(head, end);
  }
  std::ranges::sort(reached);
  return is_bound;
}

}  // namespace quillet
