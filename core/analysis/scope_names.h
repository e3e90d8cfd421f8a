// Which scope each record of a file belongs to, as a dotted name: "" for the module, then the names of
// classes and functions, such as "Shop.total".
//
// Worked out from the lines alone: where a line stands follows from the definitions that are open
// around it, and what a definition is called from the tokens of its head. Three things move a record
// out of the scope in which its statement stands. Parameters and type parameters belong to the scope
// that the statement opens. A name that is declared `global` belongs to the module. One that is
// declared `nonlocal` belongs to the nearest function around that binds it, and where none does to the
// nearest function. A declaration holds for its whole scope, and so for records in front of it, and
// takes every record whose name begins with it, such as `x.y` where `x` is declared; the declaration
// itself stays where it stands.
//
// The trap is that names repeat: an overloaded function opens the scope "f" many times. Those are
// scopes of their own where a declaration is looked up, and one name to a reader.
#pragma once

#include <cstdint>
#include <functional>
#include <span>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "analysis/file_analyzer.h"
#include "foundations/arena.h"

namespace quillet {

// The name that a record is about up to its first trailer: "a" of "a.b[0]".
Text RootOfName(Text name);

class ScopeNames {
 public:
  // A dotted name holds at most so many bytes. What would have a longer one keeps that of the scope
  // around it, so that neither depth nor long identifiers make names that grow with the square of a
  // source.
  static constexpr size_t kMaxNameSize = 400;
  static constexpr uint32_t kNone = UINT32_MAX;

  enum class ScopeKind : uint8_t { kModule, kClass, kFunction, kTypeAlias };
  struct Scope {
    uint32_t parent;     // kNone for the module
    uint32_t row;        // of its head; kNone for the module
    uint32_t last_line;  // from 0, of its last statement
    uint32_t name;       // index in names()
    Text own_name;       // as the head spells it; empty for the module
    ScopeKind kind;
    bool has_declarations;  // holds a `global` or `nonlocal` statement
  };

  // Looks at a file that was analysed; what it gives stands until the next call or the next file.
  void Build(const FileAnalyzer& file);

  // The module is the first.
  std::span<const Scope> scopes() const { return scopes_; }
  // All dotted names, each once; that of the module is the first.
  std::span<const Text> names() const { return names_; }
  Text NameOf(const Scope& scope) const { return names_[scope.name]; }

  // The scope in which a row's statement stands, and the one that it opens (kNone for most).
  uint32_t ScopeOfRow(size_t row) const { return row_scopes_[row]; }
  uint32_t ScopeOpenedBy(size_t row) const;
  // The scope to which a record of a row belongs.
  uint32_t ScopeOf(size_t row, const Record& record, bool is_parameter) const {
    const uint32_t around = row_scopes_[row];
    if (is_parameter) [[unlikely]] {
      const uint32_t opened = ScopeOpenedBy(row);
      return opened != kNone ? opened : around;
    }
    return scopes_[around].has_declarations ? DeclaredScope(around, record) : around;
  }

 private:
  // A name in a scope.
  struct Key {
    uint32_t scope;
    Text name;
    friend bool operator==(const Key&, const Key&) = default;
  };
  struct KeyHash {
    size_t operator()(const Key& key) const { return std::hash<Text>()(key.name) * 31 + key.scope; }
  };

  void FindScopes(const FileAnalyzer& file);
  void FindDeclarations(const FileAnalyzer& file);
  void ResolveNonlocals(const FileAnalyzer& file);
  uint32_t Open(const FileAnalyzer& file, uint32_t row, ScopeKind kind);
  uint32_t InternName(Text dotted);
  uint32_t DeclaredScope(uint32_t scope, const Record& record) const;

  std::vector<Scope> scopes_;
  std::vector<Text> names_;
  std::unordered_map<Text, uint32_t> name_index_;
  std::vector<uint32_t> row_scopes_;
  std::vector<uint32_t> open_;
  std::unordered_map<Key, uint32_t, KeyHash> declared_;  // to the scope it belongs to
  std::vector<Key> nonlocals_;                           // in order of their scopes' heads
  bool has_declarations_ = false;
  std::string buffer_;
  TextArena texts_;
};

}  // namespace quillet
