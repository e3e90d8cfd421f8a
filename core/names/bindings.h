// What a file says about its names: every occurrence of every name, in the order of the source, the
// scopes, and the symbols that the scopes hold.
//
// All of it are plain numbers. A name stands where its occurrence begins, and is as long as its text,
// which the file's list of texts has once. Each scope has a symbol of its own for every name that it
// mentions, as the language's own symbol tables have it: a function that reads a global name has a
// symbol for it. The symbol that owns the variable is one step away (NameSymbol::variable), and is
// what binds occurrences in different scopes together.
// What only comments and strings mention, and what the language makes up, has symbols and scopes that
// are not listed: they answer where a name belongs, and are in no table of the language.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "analysis/record_table.h"
#include "foundations/text.h"

namespace quillet {

inline constexpr uint32_t kNoIndex = UINT32_MAX;

// What an occurrence does to its name.
enum class NameRole : uint8_t {
#define QUILLET_NAME_ROLE(identifier, word) k##identifier,
#include "names/words.def"
};

// What a name is bound to, for occurrences that bind it.
enum class NameKind : uint8_t {
  kNone,
#define QUILLET_NAME_KIND(identifier, word) k##identifier,
#include "names/words.def"
};

enum class NameScopeKind : uint8_t {
#define QUILLET_NAME_SCOPE_KIND(identifier, word) k##identifier,
#include "names/words.def"
};

// Where an occurrence stands: bits of Occurrence::flags.
enum NameFlag : uint8_t {
#define QUILLET_NAME_FLAG(identifier, number, word) kName##identifier = number,
#include "names/words.def"
};

// The words of roles, kinds (without kNone) and kinds of scopes in their order, and those of flags by
// the number of their bit.
std::span<const Text> NameRoleWords();
std::span<const Text> NameKindWords();
std::span<const Text> NameScopeKindWords();
std::span<const Text> NameFlagWords();

struct Occurrence {
  // The farthest receiver that can be told; one farther away is none.
  static constexpr uint32_t kMaxReceiverDistance = (1u << 18) - 1;

  uint32_t begin;  // offset in the source, in bytes
  uint32_t text;   // as it is spelled; index in Bindings::texts
  uint32_t place;  // has_symbol: the symbol that its scope has for it; otherwise its scope
  NameRole role : 3;
  NameKind kind : 3;
  uint32_t flags : 6;  // bits of NameFlag
  uint32_t is_attribute : 1;
  uint32_t has_symbol : 1;
  uint32_t receiver_distance : 18;  // how many occurrences in front the receiver stands; 0 for none

  // Whether the name is given something here: uses have no kind.
  bool binds() const { return kind != NameKind::kNone; }
};
static_assert(sizeof(Occurrence) == 16, "every name of a source has one");

struct NameSymbol {
  // The definitions and uses of a name in its scope.
  enum Use : uint16_t {
    kGlobalStatement = 1,
    kBound = 2,  // by an assignment, a definition, a loop and the like
    kParameter = 4,
    kNonlocalStatement = 8,
    kRead = 16,
    kImported = 32,
    kAnnotated = 64,
    kNamespace = 128,  // a class or a function of this name is defined
    kTypeParameter = 256,
    kPassedBy = 512,  // a function inside of the class uses a variable of this name around the class
  };
  enum class Resolution : uint8_t { kLocal, kExplicitGlobal, kImplicitGlobal, kFree };

  uint32_t name;      // mangled and normalised; index in Bindings::texts
  uint32_t scope;     // that mentions it
  uint32_t variable;  // the symbol of the scope that owns it: this one, or that of a scope around
  uint32_t next;      // of the same scope, in order of first mention; kNoIndex behind the last one
  uint16_t uses;      // bits of Use
  Resolution resolution;
  bool is_listed;  // the language's own symbol table of the scope has it
};
static_assert(sizeof(NameSymbol) == 20);

struct NameScope {
  uint32_t parent;        // kNoIndex for the module; otherwise smaller than the scope's own index
  uint32_t name;          // as spelled; index in Bindings::texts, kNoIndex for scopes without a name
  uint32_t first_symbol;  // follow NameSymbol::next; kNoIndex without any
  uint32_t symbol_count;  // listed or not
  uint32_t begin;         // offset of the first byte: of a definition the word it begins with, without decorators
  uint32_t end;           // behind the last byte of its last statement
  NameScopeKind kind;
  bool is_listed;  // false where the language's own symbol tables lack it: in comments, strings and
                   // annotations that are never evaluated
  bool is_async;
  bool has_star_import;  // `from m import *` stands in it
  bool is_generator;     // a comprehension in parentheses
  bool sees_class;       // an annotation or type parameter scope to which the names of the class around are visible
};

// Of one file. Copies hold no more memory than they need.
struct Bindings {
  std::vector<Occurrence> occurrences;  // in order of the source
  std::vector<NameScope> scopes;        // the module first, each behind the scope around it
  std::vector<NameSymbol> symbols;
  TextList texts;
  std::vector<uint32_t> line_starts;  // offsets, as in SourceText
  bool is_python2 = false;

  Text TextOf(const Occurrence& occurrence) const { return texts[occurrence.text]; }
  uint32_t EndOf(const Occurrence& occurrence) const {
    return occurrence.begin + static_cast<uint32_t>(TextOf(occurrence).size());
  }
  // Empty for scopes without a name: those of no definition, and of a broken one.
  Text NameOf(const NameScope& scope) const { return scope.name != kNoIndex ? texts[scope.name] : Text(); }
  // The scope in which it stands.
  uint32_t ScopeOf(const Occurrence& occurrence) const {
    return occurrence.has_symbol ? symbols[occurrence.place].scope : occurrence.place;
  }
  // The symbol of the variable that it belongs to; kNoIndex for attributes, keyword names and paths.
  uint32_t VariableOf(const Occurrence& occurrence) const {
    return occurrence.has_symbol ? symbols[occurrence.place].variable : kNoIndex;
  }
  // The index of the receiver of an attribute; kNoIndex where it is no name.
  uint32_t ReceiverOf(uint32_t index) const {
    const uint32_t distance = occurrences[index].receiver_distance;
    return distance != 0 ? index - distance : kNoIndex;
  }
  // Line and column from 0, in bytes. Logarithmic in the number of lines.
  Position PositionOf(uint32_t offset) const;

  // Whether its scope binds it.
  static bool IsBound(const NameSymbol& symbol) {
    return (symbol.uses & (NameSymbol::kBound | NameSymbol::kParameter | NameSymbol::kImported)) != 0;
  }

  // The questions of the standard library's symtable.Symbol, as the version's own answers them.
  bool IsParameter(const NameSymbol& symbol) const { return (symbol.uses & NameSymbol::kParameter) != 0; }
  bool IsGlobal(const NameSymbol& symbol) const;
  bool IsDeclaredGlobal(const NameSymbol& symbol) const {
    return symbol.resolution == NameSymbol::Resolution::kExplicitGlobal;
  }
  bool IsNonlocal(const NameSymbol& symbol) const { return (symbol.uses & NameSymbol::kNonlocalStatement) != 0; }
  bool IsLocal(const NameSymbol& symbol) const;
  bool IsFree(const NameSymbol& symbol) const { return symbol.resolution == NameSymbol::Resolution::kFree; }
  bool IsImported(const NameSymbol& symbol) const { return (symbol.uses & NameSymbol::kImported) != 0; }
  bool IsAssigned(const NameSymbol& symbol) const { return (symbol.uses & NameSymbol::kBound) != 0; }
  bool IsReferenced(const NameSymbol& symbol) const { return (symbol.uses & NameSymbol::kRead) != 0; }
  bool IsAnnotated(const NameSymbol& symbol) const { return (symbol.uses & NameSymbol::kAnnotated) != 0; }
  bool IsNamespace(const NameSymbol& symbol) const { return (symbol.uses & NameSymbol::kNamespace) != 0; }

  // The bytes that it occupies, nearly.
  size_t ByteSize() const;
  void Clear();
};

// The dotted name of each scope, as its classes and functions make it, such as "Shop.total"; of what is nested in one
// without a name, that one's. UTF-8 whatever the source is.
std::vector<std::string> QualifiedNames(const Bindings& bindings);

// The occurrences of each symbol, in order: of one that owns its variable all of them, wherever they
// stand; of any other those that stand in its scope. Made in one pass, for who asks more than once.
class OccurrencesOfSymbols {
 public:
  explicit OccurrencesOfSymbols(const Bindings& bindings);

  std::span<const uint32_t> Of(uint32_t symbol) const {
    return std::span(indices_).subspan(begins_[symbol], begins_[symbol + 1] - begins_[symbol]);
  }

 private:
  std::vector<uint32_t> begins_;
  std::vector<uint32_t> indices_;
};

}  // namespace quillet
