// Workspace: the questions that people ask about a program, answered from its files as they are.
//
// A place is a file and an offset in bytes. Every answer says how sure it is. Nothing throws for any place of any
// file; what nothing is known of gives nothing. A file that changes while a question is answered may end it by
// SourceChanged (program/files.h): it is to be asked again behind Refresh. One thread at a time.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "analysis/file_analyzer.h"
#include "foundations/columns.h"
#include "program/files.h"
#include "program/modules.h"

namespace quillet {

// How sure an answer is.
enum class Certainty : uint8_t {
  kCertain,  // the language decides it, or types do
  kLikely,   // inferred from calls, from what is used, from what may be something else too
  kByName,   // has the name, and nothing else is known
};
Text WordOf(Certainty certainty);  // "certain", "likely", "by name"

struct Location {
  FileId file = kNoFile;
  uint32_t begin = 0;
  uint32_t end = 0;
  Text role;  // words of the binder; "module" for a file as a whole
  Text kind;  // of what is bound there; empty without
  Certainty certainty = Certainty::kCertain;
};

struct Completion {
  std::string name;
  std::string
      kind;  // "class", "function", "method", "property", "variable", "parameter", "module", "keyword", "attribute"
  std::string detail;         // a type or a signature
  std::string documentation;  // first paragraph, where it is there without another file's analysis
  Certainty certainty = Certainty::kCertain;
};

struct TextEdit {
  FileId file = kNoFile;
  uint32_t begin = 0;
  uint32_t end = 0;
  std::string text;
};

struct Parameter {
  std::string label;  // `x: int = 0`
  std::string name;
};
struct Signature {
  std::string label;  // `def total(self, tax: float = 0) -> float`
  std::string documentation;
  std::vector<Parameter> parameters;
  int active = -1;  // the parameter at the place; -1 without one
  Certainty certainty = Certainty::kCertain;
};

struct Hover {
  std::string text;           // the declaration: `def total(self) -> int`, `x: int`, `module os.path`
  std::string documentation;  // the docstring, dedented
  std::vector<std::string> types;
  Certainty certainty = Certainty::kCertain;
  uint32_t begin = 0;  // of the name at the place
  uint32_t end = 0;
};

struct SymbolInfo {
  std::string name;
  std::string kind;       // "class", "function", "method", "variable"
  std::string container;  // dotted name around; the module's without
  FileId file = kNoFile;
  uint32_t begin = 0;  // of the name
  uint32_t end = 0;
  Position place;  // of its beginning
  int32_t end_column = 0;
};

struct OutlineItem {
  std::string name;
  std::string kind;    // "class", "function", "method", "variable", "attribute"
  std::string detail;  // the signature
  uint32_t begin = 0;  // of the whole, decorators included
  uint32_t end = 0;
  uint32_t name_begin = 0;
  uint32_t name_end = 0;
  int parent = -1;  // index of the item around
};

struct Call {
  Location function;            // the one that calls, or is called: its name
  std::string name;             // qualified
  std::vector<Location> calls;  // where
};

struct Problem {
  uint32_t begin = 0;
  uint32_t end = 0;
  std::string code;  // "syntax", "unresolved-import", "unbound-name"
  std::string message;
};

// Lines that an editor may show as one, from 1, the last one included.
struct Fold {
  int first_line = 1;
  int last_line = 1;
  Text kind;  // "comment", "imports", "region"; empty for any other
};

struct Span {
  uint32_t begin = 0;
  uint32_t end = 0;
};

// What a name is, as an editor colours it.
enum class TokenKind : uint8_t {
  kNamespace,
  kClass,
  kEnum,
  kTypeParameter,
  kFunction,
  kMethod,
  kProperty,
  kVariable,
  kParameter,
  kEnumMember,
  kDecorator,
};
enum TokenModifier : uint8_t {
  kTokenDeclaration = 1,
  kTokenReadonly = 2,
  kTokenStatic = 4,
  kTokenAsync = 8,
  kTokenModification = 16,
  kTokenDocumentation = 32,
  kTokenDefaultLibrary = 64,
};
struct ColouredName {
  uint32_t begin = 0;
  uint32_t end = 0;
  TokenKind kind = TokenKind::kVariable;
  uint8_t modifiers = 0;  // bits of TokenModifier
};

// What an editor may show within a line: a type behind what has it, or the parameter in front of an argument.
struct InlineHint {
  uint32_t offset = 0;
  std::string text;  // `: int`, ` -> int`, `tax=`
  bool is_type = true;
  Certainty certainty = Certainty::kCertain;
};

struct Rename {
  std::vector<TextEdit> edits;  // in order of files and offsets
  std::string problem;          // why it cannot be done; empty where it can
};

class Workspace {
 public:
  struct Settings {
    std::vector<std::string> roots;      // folders of the project
    std::string exclude;                 // lines of an ignore file for each of them
    std::string index_maker;             // what made the indexes that may be used; empty for none
    std::vector<std::string> libraries;  // the environment's
    std::string typeshed;
    Version version;
    // Bytes of files that may be held, and up to which those are that a question only goes over.
    size_t most_held = size_t{120} << 20;
    size_t most_visited = size_t{48} << 20;
    // Bytes of what was found about values, roughly, that may be remembered.
    size_t most_remembered = size_t{32} << 20;
    // What finds errors of syntax; without it there are none.
    std::shared_ptr<const FileAnalyzer::Options> analyzer;
  };
  explicit Workspace(Settings settings);
  ~Workspace();
  Workspace(const Workspace&) = delete;
  Workspace& operator=(const Workspace&) = delete;

  FileId FileOf(Text path);
  const std::string& PathOf(FileId file) const;
  // What columns count, bytes without it. For who counts otherwise a byte order mark at the beginning of a buffer
  // stands in its first line, as it does in an editor's text that begins with one.
  void set_column_unit(ColumnUnit unit);
  // Line and column from 1; and back, held to the file. 0 and (1, 1) for a file that cannot be read. Cheap for
  // places of a file in their order.
  Position PlaceOf(FileId file, uint32_t offset);
  uint32_t OffsetOf(FileId file, int line, int column);
  // The bytes of a line, for showing an answer.
  std::string LineOf(FileId file, uint32_t offset);
  bool CanRead(FileId file);

  void Open(FileId file, std::string text);
  void Change(FileId file, uint32_t begin, uint32_t end, Text text);
  void Close(FileId file);
  // Looks for changed files; questions do it on their own unless they were asked a moment ago.
  void Refresh();
  // For who ended a question by an exception (stop.h): what it was in the middle of is forgotten.
  void Recover();

  std::vector<Location> Definitions(FileId file, uint32_t offset);
  // Where the types of what is there are defined.
  std::vector<Location> TypeDefinitions(FileId file, uint32_t offset);
  // Where what is there is declared: in stubs, where there are some, and otherwise where it is defined.
  std::vector<Location> Declarations(FileId file, uint32_t offset);
  // The classes below a class in all degrees, and the methods that override a method; of anything else, or where there
  // are none, the definitions.
  std::vector<Location> Implementations(FileId file, uint32_t offset);
  // In order of files and offsets; the definitions are among them.
  std::vector<Location> References(FileId file, uint32_t offset, bool everywhere = true);
  std::vector<std::string> Types(FileId file, uint32_t offset);
  Hover HoverAt(FileId file, uint32_t offset);
  std::vector<Signature> Signatures(FileId file, uint32_t offset);
  std::vector<Completion> Complete(FileId file, uint32_t offset);
  // What one of the names is that may be written at a place; without text where that is not known.
  Hover DescribeCompletion(FileId file, uint32_t offset, Text name);
  Rename RenameTo(FileId file, uint32_t offset, Text name, bool only_certain = true);
  std::vector<SymbolInfo> Symbols(Text query, size_t most = 200);
  std::vector<OutlineItem> Outline(FileId file);
  std::vector<Call> Callers(FileId file, uint32_t offset);
  std::vector<Call> Callees(FileId file, uint32_t offset);
  std::vector<Location> Supertypes(FileId file, uint32_t offset);
  std::vector<Location> Subtypes(FileId file, uint32_t offset);
  std::vector<Problem> Problems(FileId file);
  // Blocks, brackets and strings of several lines, comments, imports and `# region`s, each beginning on a line of its
  // own, in order.
  std::vector<Fold> Folds(FileId file);
  // What holds a place: the name or expression, those around it, statements, blocks, the file; the smallest first.
  std::vector<Span> Selections(FileId file, uint32_t offset);
  // The names of the file, in order, or those that begin between two offsets.
  std::vector<ColouredName> Colours(FileId file, uint32_t begin = 0, uint32_t end = UINT32_MAX);
  // Of the statements that begin there: types of variables and results that are not written and not plain to see, and
  // parameters that arguments without a name are given to.
  std::vector<InlineHint> Hints(FileId file, uint32_t begin = 0, uint32_t end = UINT32_MAX);
  // The source, as columns count it; empty for a file that cannot be read.
  Text SourceOf(FileId file);
  // A dotted name, such as `Shop.total` or `shop.Shop.total`: what is defined by it in the project.
  std::vector<Location> Named(Text dotted);

  // Whether the last answer met a bound of its work.
  bool was_bounded() const;
  size_t ByteSize() const;

  class Impl;

 private:
  std::unique_ptr<Impl> impl_;
};

}  // namespace quillet
