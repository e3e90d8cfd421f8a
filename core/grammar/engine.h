// The parser engine: grammar tables, a stack of its own, and a builder that makes the nodes.
//
// Input depth never becomes machine-stack depth. The stack holds only rules that have two children
// or more, or one and a second under way: entering an expression goes down a chain of rules at once,
// and the next token picks, in one lookup, the rule of the chain that takes it (tables.h). Rules
// above it matched one child and vanish without a node; rules below wait, as a numbered prefix of
// the chain, until their one child is there. The children of all open rules stand on one stack, so
// that a rule's are side by side when it ends.
//
// A builder is a class with
//   using Node = ...;                                            a pointer-like value
//   Node Leaf(int type, const Token& token, int32_t context);    at a token's shift
//   Node Rule(int symbol, Node* children, uint32_t count);       at a rule's end, children in order
//   void Drop(Node node);                                        a node that a failed parse leaves
// Rule has the children from its call on, also where it throws. A builder that throws, like a token
// that is not acceptable, leaves an engine that takes nothing until Setup; it must not call the
// engine back.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <type_traits>
#include <utility>

#include "foundations/errors.h"
#include "grammar/grammar.h"
#include "grammar/tables.h"

namespace quillet {

template <class Builder>
class Engine {
 public:
  using Node = typename Builder::Node;
  static_assert(std::is_trivially_copyable_v<Node>);

  // `promote_single_child` false keeps rules of one child as nodes.
  Engine(const Grammar& grammar, Builder builder, bool promote_single_child = true)
      : builder_(std::move(builder)), promote_(promote_single_child), tables_(grammar.tables()) {}
  Engine(const Engine&) = delete;
  Engine& operator=(const Engine&) = delete;
  ~Engine() { DropNodes(); }

  // Starts a new input; what a failed statement left on the stack is dropped. ValueError for a
  // number that is no symbol of the grammar.
  void Setup(int start_symbol) {
    DropNodes();
    row_ = Tables::kDeadRow;
    const size_t index = static_cast<size_t>(start_symbol) - Grammar::kFirstSymbol;
    if (index >= tables_->start_row.size()) {
      ThrowError(ErrorKind::kValueError, "no symbol has the number " + std::to_string(start_symbol));
    }
    entries_.ShrinkIfHuge();
    children_.ShrinkIfHuge();
    entries_.Clear();
    entries_.Push({Tables::kDoneRow, Tables::kNoPrefix, 0});
    row_ = tables_->start_row[index];
    entries_.Push({row_, Tables::kNoPrefix, 0});
  }

  // A quiet engine throws nothing where the input is not acceptable: it takes no more of it, and gives no root.
  void set_is_quiet(bool is_quiet) { is_quiet_ = is_quiet; }

  // ParseError with `context` where the token is not acceptable here (message "bad input"), is no
  // terminal of the grammar ("bad token") or stands behind the end ("too much input").
  void AddToken(Grammar::LabelId label, int type, const Token& token, int32_t context) {
    const Tables& tables = *tables_;
    const Cell cell = Descend(tables.column_of_label[label]);
    if (cell >= Tables::kFirstSpecial) [[unlikely]] {
      if (is_quiet_) return;
      ThrowUnacceptable(cell, tables.needed[pending_], type, token, context);
    }
    const Move move = tables.moves[cell];
    if (!promote_ && move.enters) [[unlikely]]
      WrapUpTo(move.prefix);
    children_.Reserve();
    const Node leaf = builder_.Leaf(type, token, context);
    if (move.enters) {
      entries_.Push({move.state, move.prefix, children_.size() - 1});
    } else {
      entries_.Top().row = move.state;
    }
    children_.PushReserved(leaf);
    row_ = move.next;
  }

  // The root, which is the caller's then; ParseError "incomplete input" where something is missing.
  Node Finish() {
    if (Descend(Tables::kEndColumn) != Tables::kComplete) {
      if (is_quiet_) return Node{};
      throw ParseError("incomplete input", -1, kNoText, Context::None());
    }
    return children_.Pop();
  }

 private:
  using Tables = Grammar::Tables;
  using Row = Tables::Row;
  using Cell = Tables::Cell;
  using Move = Tables::Move;

  // A rule that has children: the row of its state, the rules around it that have none but it, and
  // where its children begin. The one at the bottom stands for the complete input.
  struct Entry {
    Row row;
    Row prefix;
    uint32_t first_child;
  };
  static_assert(sizeof(Entry) == 8);

  // A stack whose memory is kept from one input to the next, but for what a huge one needed.
  template <class T>
  class Stack {
   public:
    uint32_t size() const { return size_; }
    T* data() { return items_.get(); }
    T& Top() { return items_[size_ - 1]; }
    T Pop() { return items_[--size_]; }
    void Clear() { size_ = 0; }
    void Truncate(uint32_t size) { size_ = size; }
    void Reserve() {
      if (size_ == capacity_) [[unlikely]]
        Grow();
    }
    void PushReserved(T item) { items_[size_++] = item; }
    void Push(T item) {
      Reserve();
      PushReserved(item);
    }
    void ShrinkIfHuge() {
      if (capacity_ <= kKeptCapacity) [[likely]]
        return;
      items_.reset();
      size_ = capacity_ = 0;
    }

   private:
    static constexpr uint32_t kKeptCapacity = 1 << 14;

    [[gnu::noinline]] void Grow() {
      if (capacity_ > UINT32_MAX / 2) ThrowError(ErrorKind::kOverflowError, "the input is nested too deep");
      const uint32_t capacity = std::max<uint32_t>(64, capacity_ * 2);
      std::unique_ptr<T[]> items(new T[capacity]);
      std::copy_n(items_.get(), size_, items.get());
      items_ = std::move(items);
      capacity_ = capacity;
    }

    std::unique_ptr<T[]> items_;
    uint32_t size_ = 0;
    uint32_t capacity_ = 0;
  };

  // Ends every rule that a token of this column ends; gives the cell that says what comes of the
  // token. The row of the engine is not written before the token is taken: until then, and for
  // good after a failure, it is the dead one.
  Cell Descend(uint32_t column) {
    const Tables& tables = *tables_;
    const Cell* const cells = tables.cells.data() + column;
    Row row = std::exchange(row_, Tables::kDeadRow);
    for (;;) {
      const Cell cell = cells[row * tables.columns];
      if (cell == Tables::kVanish) {
        if (!promote_) [[unlikely]]
          WrapAll(row);
        row = entries_.Top().row;
      } else if (cell == Tables::kReduce) {
        const Entry entry = entries_.Pop();
        ReduceChildren(entry);
        row = entry.prefix != Tables::kNoPrefix ? entry.prefix : entries_.Top().row;
      } else {
        if (!promote_ || cell >= Tables::kFirstSpecial) [[unlikely]]
          pending_ = row;
        return cell;
      }
    }
  }

  // Makes one node of an entry's children. Only the start symbol may have but one.
  void ReduceChildren(const Entry& entry) {
    const uint32_t count = children_.size() - entry.first_child;
    if (count == 1 && promote_) [[unlikely]]
      return;
    children_.Truncate(entry.first_child);
    const Node node = builder_.Rule(tables_->symbol[entry.row], children_.data() + entry.first_child, count);
    children_.PushReserved(node);
  }

  // Without promotion: the rules of a chain that end with one child get a node each.
  [[gnu::noinline]] void WrapAll(Row row) {
    for (; row != Tables::kNoPrefix; row = tables_->prefix[row]) WrapTopChild(row);
  }
  // The same for those above the rule that takes the next token, which is the one behind `prefix`.
  [[gnu::noinline]] void WrapUpTo(Row prefix) {
    for (Row row = pending_; tables_->prefix[row] != prefix; row = tables_->prefix[row]) WrapTopChild(row);
  }
  void WrapTopChild(Row row) {
    children_.Truncate(children_.size() - 1);
    const Node node = builder_.Rule(tables_->symbol[row], children_.data() + children_.size(), 1);
    children_.PushReserved(node);
  }

  [[noreturn, gnu::noinline, gnu::cold]] static void ThrowUnacceptable(Cell cell, TokenCode needed, int type,
                                                                       const Token& token, int32_t context) {
    const char* message = cell == Tables::kBadToken       ? "bad token"
                          : cell == Tables::kTooMuchInput ? "too much input"
                                                          : "bad input";
    ParseError error(message, type, token.view(), Context::Index(context));
    error.needed = needed;
    throw ParseError(error);
  }

  void DropNodes() {
    while (children_.size() > 0) builder_.Drop(children_.Pop());
  }

  Builder builder_;
  const bool promote_;
  bool is_quiet_ = false;
  const std::shared_ptr<const Tables> tables_;
  Row row_ = Tables::kDeadRow;  // where the parse stands
  // The row that the last cell was from: of a token that is not taken and, without promotion, of any.
  Row pending_ = Tables::kDeadRow;
  Stack<Entry> entries_;
  Stack<Node> children_;
};

}  // namespace quillet
