// What the files of a project define, by name: enough to say where a name is defined without holding the files.
//
// A file is bound once, and its definitions are kept, 24 bytes each, until it changes. What it may define at all is
// told by its text in a third of the time.
#pragma once

#include <cstdint>
#include <memory>
#include <span>

#include "foundations/text.h"
#include "names/bindings.h"
#include "program/files.h"

namespace quillet {

class DefinedNames {
 public:
  // A place where a class, a function, or a variable of a module or of a class is bound, or an attribute of `self`.
  struct Definition {
    uint32_t name;   // number of its text, as it is spelled
    uint32_t scope;  // of the names of the classes and functions around, with dots; kNoIndex where there are none
    uint32_t begin;
    int32_t line;    // counted from one, as the column is
    int32_t column;  // 0 where letters beyond ASCII stand in front of the name's end: what counts as one depends on who
                     // asks
    NameRole role;
    NameKind kind : 4;   // kNone for attributes
    bool is_symbol : 1;  // what one looks for by name: no attribute, and of a variable the first place alone
    bool in_class : 1;   // in the body of one
    bool of_self : 1;    // an attribute
  };
  static_assert(sizeof(Definition) == 24);

  explicit DefinedNames(const Files& files);
  ~DefinedNames();
  DefinedNames(const DefinedNames&) = delete;
  DefinedNames& operator=(const DefinedNames&) = delete;

  // Reads those of the files that were not read, or have changed.
  void Read(std::span<const FileId> files);
  // The same, but leaves out files, as long as they were never read, in whose text the name is plainly no member that
  // is defined: local, called, or of something else than `self`. What their lines say is kept.
  void ReadForMember(std::span<const FileId> files, Text name);
  // Whether the text of a file says that it may define a member, by an attribute of anything as well. One that the body
  // of a class imports is none.
  bool MayDefineMember(FileId file, Text name) const;
  // Of a file that was read, in the order of the source; until the next Read.
  std::span<const Definition> Of(FileId file) const;

  // A name that may be a symbol of a file.
  struct PossibleSymbol {
    uint32_t name : 30;
    uint32_t is_variable : 1;    // otherwise a class or a function
    uint32_t may_be_member : 1;  // otherwise surely in the body of no class
  };
  // Finds which symbols files may define that were not read, or have changed, by their text; reads those whose text
  // does not tell.
  void ReadPossible(std::span<const FileId> files);
  // All symbols of such a file and some more, in no order; some more than once.
  std::span<const PossibleSymbol> PossibleOf(FileId file) const;
  // Whether Of says what there is.
  bool IsRead(FileId file) const;

  // How many texts there are, and a number's text.
  uint32_t text_count() const;
  Text TextOf(uint32_t number) const;
  // kNoIndex for what no file that was read defines.
  uint32_t Find(Text name) const;

  // Read looks whether files have changed when it is called the next time. Buffers are looked at each time.
  void Forget();
  size_t ByteSize() const;

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

// The names of the classes and functions around and of the scope itself, with dots; empty for that of the module.
std::string DottedNameOf(const Bindings& bindings, uint32_t scope);

}  // namespace quillet
