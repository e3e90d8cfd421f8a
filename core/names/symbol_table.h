// The scopes and symbols of a file while it is read, and afterwards which symbol owns each variable.
//
// A scope and the number of a name find a symbol in one table for the whole file. What a name is called
// in its scope is settled here: its normal form, and for a private name in a class the mangled one.
#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
#include <vector>

#include "foundations/text.h"
#include "names/bindings.h"
#include "names/text_table.h"

namespace quillet {

// Brings a name that is not ASCII into the normal form of the language (NFKC); false, or the same bytes, for
// one that is in it. It may be called by any thread.
using NameNormalizer = bool (*)(Text name, std::string& normal_form);

class SymbolTable {
 public:
  SymbolTable(Version version, Bindings& out) : version_(version), out_(out) {}

  // For another file, of `size` bytes and about `names` names.
  void Begin(size_t size, size_t names, NameNormalizer normalizer);

  TextTable& texts() { return texts_; }

  struct NewScope {
    NameScopeKind kind;
    uint32_t parent;
    uint32_t name;  // kNoIndex for none
    uint32_t begin;
    bool is_listed;
    bool is_async = false;
    bool is_generator = false;
    bool sees_class = false;
    bool is_private = false;  // private names in it are those of a class with its name
  };
  uint32_t Open(const NewScope& scope);
  NameScope& operator[](uint32_t scope) { return out_.scopes[scope]; }
  bool IsFunctionLike(uint32_t scope) const {
    switch (out_.scopes[scope].kind) {
      case NameScopeKind::kFunction:
      case NameScopeKind::kLambda:
      case NameScopeKind::kComprehension:
        return true;
      default:
        return false;
    }
  }
  // The scope in which `:=` binds: for a comprehension the one around all that it is nested in.
  uint32_t WalrusScope(uint32_t scope) const { return notes_[scope].walrus_scope; }
  // The scope of the annotations of a scope; kNoIndex before there is one.
  uint32_t& AnnotationScope(uint32_t scope) { return notes_[scope].annotation_scope; }

  NameSymbol& symbol(uint32_t symbol) { return out_.symbols[symbol]; }
  // The symbol that a scope has for a name, as spelled; made where there is none.
  uint32_t SymbolOf(uint32_t scope, uint32_t text) {
    TextTable::Entry& entry = texts_[text];
    if (entry.last_scope == scope) return entry.last_symbol;
    if (entry.form != TextTable::kPlain) [[unlikely]]
      return SpecialSymbolOf(scope, text);
    const uint32_t found = SymbolNamed(scope, text);
    entry.last_scope = scope;
    entry.last_symbol = found;
    return found;
  }
  // The same for a type parameter that the scope declares.
  uint32_t TypeParameterOf(uint32_t scope, uint32_t text);
  // The same for what the scope calls it.
  uint32_t SymbolNamed(uint32_t scope, uint32_t name);
  // kNoIndex where there is none.
  uint32_t Find(uint32_t scope, uint32_t name) const;

  // Settles for each symbol how it is resolved and who owns its variable, and which symbols and texts
  // the file has.
  void Resolve();

 private:
  // What is known of a scope beside what is handed out.
  struct Note {
    uint32_t last_symbol = kNoIndex;
    uint32_t walrus_scope = 0;
    uint32_t annotation_scope = kNoIndex;
    uint32_t private_class = kNoIndex;  // the name of the class whose private names are mangled
    // From 3.13 on: the scope of type parameters, in front of the class's body, which alone are mangled.
    uint32_t mangled_parameters = kNoIndex;
    uint32_t first_child = kNoIndex;
    uint32_t next_sibling = kNoIndex;
  };
  static constexpr size_t kSmallestMangleBudget = size_t{1} << 20;

  uint32_t SpecialSymbolOf(uint32_t scope, uint32_t text);
  uint32_t NormalForm(uint32_t text);
  uint32_t NameInScope(uint32_t scope, uint32_t text);
  uint32_t Mangle(uint32_t class_name, uint32_t text);
  size_t SlotOf(uint32_t scope, uint32_t name) const {
    const uint64_t key = (uint64_t{scope} << 32 | name) * 0x9E3779B97F4A7C15u;
    return (key ^ key >> 32) & mask_;
  }
  uint32_t AddSymbol(uint32_t scope, uint32_t name);
  void GrowSlots();

  void ResolveScope(uint32_t scope);
  void PublishScope(uint32_t scope);
  void ResolveSymbol(uint32_t symbol, uint32_t class_around);
  uint32_t ModuleSymbol(uint32_t name);
  void PassThrough();
  void MarkNamespaces();

  const Version version_;
  Bindings& out_;
  NameNormalizer normalizer_ = nullptr;
  TextTable texts_;
  std::vector<Note> notes_;
  std::vector<uint32_t> slots_;  // of symbols; kNoIndex in an empty one
  size_t mask_ = 0;
  size_t mangle_budget_ = 0;
  std::unordered_map<uint64_t, uint32_t> mangled_;  // by class name and name
  std::string buffer_;

  // While names are resolved: by name the symbol that a nested scope sees, and what it was in front of
  // the scopes that are open.
  struct Shadowed {
    uint32_t name;
    uint32_t symbol;
  };
  std::vector<uint32_t> visible_;
  std::vector<Shadowed> shadowed_;
};

}  // namespace quillet
