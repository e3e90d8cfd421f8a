// Which of a variable's bindings reach a place.
//
// Statements are walked backwards from the place, out of block after block, until one is met behind which the
// variable is surely bound anew. Branches of which only one is taken stand beside each other; of a branch that
// returns or raises nothing reaches what follows; a loop's body reaches its own beginning.
#pragma once

#include <cstdint>
#include <functional>
#include <span>
#include <vector>

#include "program/source_file.h"

namespace quillet {

class Flow {
 public:
  // More bindings than this are not told apart.
  static constexpr size_t kMaxBindings = 64;
  // What more loops than this bind counts as bound anywhere in them.
  static constexpr int kMaxLoops = 400;
  // What more statements, clauses and bindings than this would have to be looked at for counts as bound anywhere in
  // front.
  static constexpr uint32_t kMaxLooks = 1 << 16;

  // The offsets, sorted, at which names of the variable's own scope bind it. `truth` says of a condition whether it
  // holds in every run: 1, 0, or -1 where that is not known.
  Flow(const SourceFile& file, std::span<const uint32_t> bindings, const std::function<int(ExprId)>& truth);

  // Appends those that reach the expression or statement at `offset`; `top` is the statement of the variable's scope.
  // Whether the variable is surely bound there.
  bool Reach(uint32_t offset, StmtId top, std::vector<uint32_t>& reached);
  // The same for the end of the scope.
  bool ReachEnd(StmtId top, std::vector<uint32_t>& reached);
  // How many statements, clauses and bindings were looked at.
  uint32_t looks() const { return looks_; }

 private:
  enum class Outcome : uint8_t { kMaybe, kAlways, kLeaves };

  bool Before(StmtId stmt, StmtId top);
  bool Above(StmtId clause);
  Outcome Group(StmtId head);
  Outcome BlockEnd(StmtId owner);
  bool Leaves(StmtId owner) const;
  bool Chain(StmtId clause);
  bool Jumps(StmtId loop, uint16_t word, bool* has_any = nullptr);
  void BackEdges(StmtId loop);
  // Adds what the head of a statement binds. Whether one is surely bound behind it; where `holds`, of a condition
  // that holds.
  bool Head(StmtId stmt, bool holds = false);
  // The same for what is bound from `begin` to `end`, of a place behind it in the same statement.
  bool Bound(uint32_t begin, uint32_t end, uint32_t place, bool holds = false);
  bool IsSure(uint32_t binding, uint32_t place, bool holds);
  void All(uint32_t begin, uint32_t end);
  size_t FirstAt(uint32_t offset) const;
  bool HasAny(uint32_t begin, uint32_t end) const;
  // The statement of a block that holds the last binding in front of `end`; kModuleStmt without one.
  StmtId LastIn(StmtId owner, uint32_t end) const;
  uint32_t InFrontOf(StmtId head, uint32_t end) const;
  StmtId HeadOfChain(StmtId stmt);
  bool MayLook() { return ++looks_ <= kMaxLooks; }
  // Ends a search that met the bound. Whether the variable is surely bound at the end of it.
  bool End(bool is_bound, uint32_t end, std::vector<uint32_t>& reached);
  void Add(uint32_t offset);
  int TruthOf(StmtId clause) const;

  const SourceFile& file_;
  const FileSyntax& syntax_;
  std::span<const uint32_t> bindings_;
  const std::function<int(ExprId)>& truth_;
  std::vector<uint32_t>* reached_ = nullptr;
  int steps_ = 0;
  uint32_t looks_ = 0;
};

// Whether a clause goes on with the statement in front of it: `elif`, `else`, `except`, `finally`.
bool ContinuesChain(StmtKind kind);
// Whether a run may come to the end of a block. `truth` says of a condition whether it holds, `returns` of an
// expression that is a statement whether it is over one day.
bool MayEnd(const FileSyntax& syntax, StmtId owner, const std::function<int(ExprId)>& truth,
            const std::function<bool(ExprId)>& returns);
// Whether whatever runs to the end of a block goes no further: it returns, raises, breaks or continues.
bool BlockLeaves(const FileSyntax& syntax, StmtId owner, bool counts_jumps);

}  // namespace quillet
