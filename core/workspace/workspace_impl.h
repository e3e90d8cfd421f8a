// The parts that questions share: the program, and how its answers are put together.
#pragma once

#include <algorithm>
#include <chrono>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <span>
#include <string>
#include <tuple>
#include <unordered_set>
#include <vector>

#include "inference/inference.h"
#include "program/defined_names.h"
#include "program/project_files.h"
#include "workspace/questions.h"

namespace quillet {

class Workspace::Impl final : public CallerSource {
 public:
  explicit Impl(Settings settings);

  std::vector<ExprPlace> CallsOf(const FunctionInfo& function) override;

  // Begins a question: files that changed are read again.
  void Begin();
  // Begins one about many places. How much of what is likely is found in each depends on what is known, so nothing is:
  // the answer is the same whatever was asked before.
  void BeginAnew();
  void Forget();
  // Where functions are called, by numbers of expressions: of no text but the one that they were found in.
  void ForgetCalls() { calls_by_name_.clear(); }
  // What was found about values, which may take much memory. Numbers of classes, functions and types hold no more
  // behind it.
  bool IsMuchRemembered() const { return inference.ByteSize() > settings.most_remembered; }
  void ForgetFound();
  // A file that a question is about.
  const SourceFile* Get(FileId file) {
    inference.KnowFile(file);
    return files.Get(file);
  }
  // The bytes of a line from 1, without its end; (0, 0) for one in front of the file, its end for one behind.
  std::pair<uint32_t, uint32_t> LineAt(const SourceFile& file, int line);
  // One of many files that a question goes over. While it lasts nothing is given back; behind it this one is, where
  // much is held and it was not before, and whatever was not asked for lately, where very much is: so no other file may
  // be in use then.
  class VisitAll;
  class Visit {
   public:
    Visit(Impl& in, FileId file);
    ~Visit();
    Visit(const Visit&) = delete;
    Visit& operator=(const Visit&) = delete;

   private:
    friend class VisitAll;
    Visit(Impl& in, FileId file, bool was_held);

    Impl& in_;
    const FileId id_;
    const bool was_held_;

   public:
    const SourceFile* const file;  // nullptr where it cannot be read
  };
  // Visits one file after another, and has some of them read ahead.
  class VisitAll {
   public:
    VisitAll(Impl& in, std::span<const FileId> files) : in_(in), files_(files) {}
    // Of the file at an index, which is the one behind the last.
    Visit At(size_t i);

   private:
    Impl& in_;
    const std::span<const FileId> files_;
    size_t read_ = 0;               // so many were read ahead
    std::vector<FileId> not_held_;  // of these, before
  };
  Text SourceForPlaces(FileId file);
  void ForgetPlaces() {
    placed = {};
    placed_source_of = kNoFile;
    placed_source.clear();
  }
  // Whether a file lies below a root of the project, and is not of an environment there.
  bool IsProject(FileId file);

  // ---- locations.cc ----
  Location At(const Binding& binding, Certainty certainty);
  Location AtOccurrence(const SourceFile& file, uint32_t index, Certainty certainty);
  std::vector<Location> LocationsOf(const Entities& entities, bool follows_source = true);
  // Where the source of a library's module says what its stub declares.
  Binding SourceOf(Binding binding);
  // What a display has to be where it stands, by an annotation or the parameter that it is given to.
  Value ExpectedOf(const SourceFile& file, ExprId expr);
  // The field of a typed dictionary that a string names.
  std::vector<Location> KeyDefinitions(const SourceFile& file, uint32_t offset);
  void AddFixture(const SourceFile& file, uint32_t occurrence, std::vector<Location>& found);
  Binding OtherSideOf(Binding binding);
  std::vector<Binding> OtherSidesOf(Binding binding);
  void Sort(std::vector<Location>& locations) const;
  // Definitions of attributes of a name in the project, where nothing is known of the receiver.
  std::vector<Location> MembersNamed(Text name);
  uint32_t OccurrenceAt(const SourceFile& file, uint32_t offset);
  Entities MethodsAt(const SourceFile& file, uint32_t occurrence);

  // ---- references.cc ----
  struct Hit {
    Location location;
    FileId file;
    uint32_t occurrence;
    bool is_below = false;  // taken from what has no such attribute, while a class below it has the one asked for
  };
  // What an entity is, by its place: numbers of classes are others once what was found is forgotten.
  struct KeptEntity {
    Entity::Kind kind = Entity::kVariable;
    FileId file = kNoFile;
    uint32_t at = kNoIndex;  // the symbol, or the statement of a member's class
    friend auto operator<=>(const KeptEntity&, const KeptEntity&) = default;
  };
  // What keeps one name, so that a program goes on doing the same.
  struct Family {
    std::vector<KeptEntity> members;  // beside what the name asked about means itself
    std::vector<KeptEntity> above;    // classes that lack the attribute, and use what those below have
    // What a certain use of a member means as well, and the use: found by Uses.
    struct Beside {
      Entity entity;
      std::optional<KeptEntity> kept;  // none for a class that a call makes, or for a module
      FileId file;
      uint32_t offset;
    };
    std::vector<Beside> beside;
  };
  std::vector<Hit> Uses(const SourceFile& file, uint32_t occurrence, bool everywhere, Family* family = nullptr);
  // What the name of an occurrence stands for, for its uses.
  Entities Meant(const SourceFile& file, uint32_t occurrence);
  // How a use's entities meet those asked for: nothing, or a certainty.
  bool Meets(const Entities& use, const std::vector<Entity>& targets, Certainty& certainty);
  bool IsCommonAttribute(Text name);
  void AddOtherSides(Entities& entities);
  void AddBeside(const SourceFile& file, uint32_t occurrence, const Entities& use, const std::vector<Entity>& wanted,
                 Family& family);
  std::optional<KeptEntity> KeptOf(const Entity& entity);
  Entity EntityOf(const KeptEntity& kept, Text name);
  bool IsReceiverKnown(const SourceFile& file, const Occurrence& occurrence, std::vector<ClassId>* classes = nullptr);
  // Leaves out files which import something else under the name of variables of modules.
  void LeaveOutOtherImports(std::vector<FileId>& candidates, Text name, const std::vector<Entity>& wanted);
  bool IsParameter(const Entity& entity);
  // Leaves out files other than those of the parameters that give nothing under their name.
  void LeaveOutFilesWithoutKeyword(std::vector<FileId>& candidates, Text name, const std::vector<Entity>& parameters);

  // ---- rename.cc ----
  Binding CallWithUnseenKeywords(const Entity& entity);
  std::vector<KeptEntity> ClassesWith(Text name);
  void AddRelated(const std::vector<KeptEntity>& definers, const std::vector<KeptEntity>& above,
                  std::vector<KeptEntity>& classes);
  std::vector<KeptEntity> AllBelow(const std::vector<KeptEntity>& classes);
  std::string AddOverrides(const Entities& meant, Text name, Text new_name, Family& family);
  std::string AddOthersMeant(Text name, Family& family, bool& has_grown);
  void AddParametersOfOverrides(const Entities& meant, Text name, Family& family);
  std::string WhyNot(const Entities& meant, Text name);
  uint32_t TakenAt(const SourceFile& file, uint32_t symbol, Text name);

  // ---- describe.cc ----
  std::string TextOfType(TypeId type, bool is_short = false, int depth = 0);
  std::string TextOfSet(TypeSetId set, bool is_short = false, int depth = 0);
  std::string FindTextOfSet(TypeSetId set, bool is_short, int depth);
  std::vector<std::string> TextsOf(Value value, bool is_short = false);
  // Types by where they are defined: their numbers say what was met first.
  std::vector<TypeId> InOrder(TypeSetId set);
  std::string TextOfFunction(FunctionId function, bool is_bound, bool has_name, bool is_short, int depth = 0);
  std::string TextOfParameter(const FunctionInfo& info, size_t index, bool is_short);
  // The text, the documentation and the types of what a name stands for.
  void Describe(Value value, Text name, Hover& hover);
  std::string DocumentationOf(FileId file, StmtId stmt);
  std::string DocumentationOf(TypeId type);
  std::string DocumentationOf(const Entity& entity);
  ExprId ExpressionClosedAt(const SourceFile& file, uint32_t offset);
  Value ValueAt(const SourceFile& file, uint32_t occurrence);

  // ---- complete.cc ----
  void AddMembers(Value receiver, Text prefix, std::vector<Completion>& found);
  void AddNames(const SourceFile& file, uint32_t offset, Text prefix, std::vector<Completion>& found);
  void AddModules(ModuleId package, Text prefix, std::vector<Completion>& found);
  void AddModuleNames(ModuleId module, Text prefix, std::vector<Completion>& found, bool with_private);
  // Whether nothing but a keyword can stand at the place: all positions of the call are taken.
  bool AddKeywords(const SourceFile& file, uint32_t offset, Text prefix, std::vector<Completion>& found);
  void AddNamesOfFile(FileId file, Text module, Text prefix, std::vector<Completion>& found,
                      std::unordered_set<std::string>& seen);
  enum class NewName : uint8_t { kNone, kMethod, kOther };
  NewName NewNameAt(const SourceFile& file, uint32_t begin);
  bool IsInBrackets(const SourceFile& file, uint32_t offset);
  std::string KindOfSymbol(const SourceFile& file, uint32_t symbol, bool in_class);

  // ---- hints.cc ----
  void AddParameterHints(const SourceFile& file, ExprId call, std::vector<InlineHint>& hints);

  // ---- calls ----
  struct Callee {
    Binding binding;
    std::string name;
    Certainty certainty;
  };
  std::vector<Callee> CalleesOf(Value callee);
  std::vector<Callee> CalleesOf(const SourceFile& file, ExprId call);
  std::vector<Location> MembersBelow(const SourceFile& file, ExprId attribute);
  std::string QualifiedName(const Binding& binding);
  // Code that runs at one time: of a function, of a lambda, or of the module, where both are none.
  struct Body {
    StmtId def = kModuleStmt;
    ExprId lambda = kNoExpr;
    friend bool operator==(const Body&, const Body&) = default;
  };
  Body BodyAround(const SourceFile& file, uint32_t offset);
  Body BodyOfStatementAt(const SourceFile& file, uint32_t offset);  // lambdas aside
  Body BodyAt(const SourceFile& file, uint32_t offset);

  Settings settings;
  Files files;
  Modules modules;
  ProjectFiles project;
  DefinedNames defined;
  Inference inference;
  bool is_bounded = false;
  ColumnUnit column_unit = ColumnUnit::kUtf8;
  // The place that was looked up last: those behind it on its line are counted from there. Holds while no text changes.
  struct Placed {
    FileId file = kNoFile;
    uint32_t offset = 0;
    Position place{1, 1};
  };
  Placed placed;
  FileId placed_source_of = kNoFile;  // of one that is not held
  std::string placed_source;
  std::unique_ptr<FileAnalyzer> analyzer;  // made when it is first needed

 private:
  // Gives files back where more is held than may be.
  void GiveBack();

  std::map<std::tuple<TypeSetId, bool, int>, std::string> texts_of_sets_;  // by depth; of this question

  bool IsBelowRoot(const std::string& path) const;

  std::vector<std::string> package_folders_;  // of an environment that lies in a root
  std::chrono::steady_clock::time_point last_refresh_{};
  std::chrono::steady_clock::duration last_look_{};  // how long it took
  std::map<std::pair<std::string, FileId>, std::vector<ExprPlace>> calls_by_name_;
  std::unordered_map<std::string, bool> common_;
};

// The number of a text among those of a file; kNoIndex where no name is spelled so.
inline uint32_t NumberOfText(const Bindings& bindings, Text name) {
  for (uint32_t i = 0; i < bindings.texts.size(); ++i)
    if (bindings.texts[i] == name) return i;
  return kNoIndex;
}

// A name that the language changes by the class it stands in.
inline bool IsPrivateName(Text name) { return name.starts_with("__") && !name.ends_with("__"); }

template <class T>
void AddNew(std::vector<T>& all, const T& one) {
  if (std::ranges::find(all, one) == all.end()) all.push_back(one);
}

inline Certainty CertaintyOf(uint8_t doubt) { return doubt == 0 ? Certainty::kCertain : Certainty::kLikely; }

}  // namespace quillet
