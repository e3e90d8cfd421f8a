// Inference: what an expression may be, and what a name stands for, in a program of many files.
//
// A value is a set of types (types.h) with a doubt: whether it may be something else too, and whether it was guessed
// from uses. Everything is found when it is asked for and remembered until Clear: nothing is done file by file
// or in an order of its own. What a function returns is found from its annotation or its own statements; where
// what it was called with matters, its statements are evaluated again in a frame, which says what its parameters
// are. Work is bounded: by steps a question, by depth, by frames. Beyond a bound the answer is open.
//
// What is remembered holds numbers and texts of its own, no view of a source: files may be given back (Files::Trim)
// between questions, as long as none is being answered.
//
// The parts: flow.cc (which assignments reach a place), narrowing.cc (what a condition says), variables.cc (what a
// name was given), classes.cc (bases, order, members), attributes.cc (what stands behind a dot), functions.cc
// (parameters and results), calls.cc, annotations.cc, expressions.cc, entities.cc (what a name stands for).
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

#include "foundations/arena.h"
#include "foundations/number_map.h"
#include "foundations/stop.h"
#include "foundations/text.h"
#include "inference/types.h"
#include "program/files.h"
#include "program/modules.h"

namespace quillet {

using ClassId = uint32_t;
using FunctionId = uint32_t;
using FrameId = uint32_t;
inline constexpr uint32_t kNoId = UINT32_MAX;
inline constexpr FrameId kNoFrame = 0;  // nothing is known of parameters but what they say themselves

enum class SpecialForm : uint8_t {
  kNone,
#define QUILLET_SPECIAL_FORM(identifier, name) k##identifier,
#include "inference/special_forms.def"
};

// A node of a file.
struct ExprPlace {
  FileId file = kNoFile;
  ExprId expr = kNoExpr;
};

struct BaseClass {
  ClassId cls = kNoId;
  std::vector<TypeSetId> args;
};

// A member of a class that a call makes: of `namedtuple("P", "x y")` and the like.
struct MadeField {
  Text name;
  uint32_t offset = 0;     // of its name, in the file of the class
  ExprId hint = kNoExpr;   // its annotation, or
  ExprId value = kNoExpr;  // what it is
};

struct ClassInfo {
  FileId file = kNoFile;
  StmtId stmt = kModuleStmt;  // its statement, or
  ExprId call = kNoExpr;      // the call that makes it
  uint32_t scope = kNoIndex;  // of its body; kNoIndex for a made one
  Text name;
  bool has_bases = false;  // the following are there
  bool has_members = false;
  bool is_finding_bases = false;
  bool is_enum = false;
  bool is_typed_dict = false;
  bool is_named_tuple = false;
  bool is_dataclass = false;
  bool is_protocol = false;
  bool is_open = false;  // a base is not known
  std::vector<BaseClass> bases;
  std::vector<BaseClass> order;    // C3, itself first; arguments in terms of its own type parameters
  size_t open_from = SIZE_MAX;     // of `order`: what stands here or behind may be overridden by an unknown base
  std::vector<TypeId> parameters;  // type variables
  ClassId metaclass = kNoId;
  std::vector<MadeField> fields;
  uint32_t foreign_base = kNoId;               // number of the dotted name of a base that is not there
  std::unordered_map<Text, uint32_t> symbols;  // of its scope
  std::unordered_map<Text, std::vector<uint32_t>> self_attributes;  // where methods write `self.x`: offsets
  std::unordered_set<Text> class_written;                           // of those the ones that class methods write
};

enum FunctionFlag : uint8_t {
  kIsAsync = 1,
  kIsGenerator = 2,
  kIsStatic = 4,
  kIsClassMethod = 8,
  kIsOverload = 16,
  kIsAbstract = 32,
};

struct FunctionInfo {
  FileId file = kNoFile;
  StmtId stmt = kModuleStmt;  // its statement, or
  ExprId lambda = kNoExpr;
  uint32_t scope = kNoIndex;
  ClassId cls = kNoId;  // in whose body it stands
  uint8_t flags = 0;
};

// What a name stands for.
struct Entity {
  enum Kind : uint8_t {
    kVariable,  // a: file, b: symbol, which owns its variable and is of no class
    kMember,    // a: class, b: number of the name
    kModule,    // a: module
  };
  Kind kind = kVariable;
  uint32_t a = 0;
  uint32_t b = 0;
  friend bool operator==(const Entity&, const Entity&) = default;
  friend auto operator<=>(const Entity&, const Entity&) = default;
};

// Entities of a name, with the doubt that it is one of them.
struct Entities {
  std::vector<Entity> found;
  uint8_t doubt = 0;
};

// Where a name is bound.
struct Binding {
  FileId file = kNoFile;
  uint32_t offset = 0;  // of the name
  friend bool operator==(const Binding&, const Binding&) = default;
  friend auto operator<=>(const Binding&, const Binding&) = default;
};

// What a lookup found behind a dot.
struct Member {
  ClassId owner = kNoId;
  std::vector<TypeSetId> args;  // of the owner, as the receiver has them
  uint32_t symbol = kNoIndex;   // of the owner's scope
  const std::vector<uint32_t>* self_attributes = nullptr;
  const MadeField* field = nullptr;
  bool is_behind_open_base = false;
};

// An argument of a call that was evaluated or will be.
struct Argument {
  enum Kind : uint8_t { kPlain, kKeyword, kStar, kDoubleStar };
  Kind kind = kPlain;
  Text name;
  ExprPlace place;  // kNoExpr where there is only a value
  FrameId frame = kNoFrame;
  Value value;
  bool is_evaluated = false;
};

// Type variables and what they are.
using Solution = std::vector<std::pair<TypeId, TypeSetId>>;

// Who calls a function: asked for parameters that nothing says anything about.
class CallerSource {
 public:
  virtual ~CallerSource() = default;
  // Calls of a function by its name, each with the place of the call's expression. Bounded.
  virtual std::vector<ExprPlace> CallsOf(const FunctionInfo& function) = 0;
};

class Inference {
 public:
  Inference(Files& files, Modules& modules);
  ~Inference();
  Inference(const Inference&) = delete;
  Inference& operator=(const Inference&) = delete;

  // Forgets everything, after a file changed.
  void Clear();
  // Begins a question: steps are counted anew.
  void Begin() {
    ++question_;
    steps_of_all_ = kMaxStepsOfAll;
    has_met_bound_ = false;
    CountAnew();
  }
  // Begins the next part of a question about many places: steps are counted anew as long as all parts together have not
  // taken too many.
  void BeginPart() {
    has_met_bound_ = IsExhausted();
    steps_of_all_ -= std::min(steps_of_all_, first_steps_ - steps_ + first_guess_steps_ - guess_steps_);
    CountAnew();
  }
  // Whether the question, or a part of it, has met a bound.
  bool IsExhausted() const { return has_met_bound_ || steps_ == 0 || guess_steps_ == 0; }
  // Of what is remembered, roughly.
  size_t ByteSize() const;
  void set_callers(CallerSource* callers) { callers_ = callers; }

  // ---- values ----
  Value ValueOf(FileId file, ExprId expr, FrameId frame = kNoFrame);
  // What a name is given where it is bound.
  Value ValueOfBinding(Binding binding, FrameId frame = kNoFrame);
  Value ValueOfEntity(const Entity& entity);
  // What the decorators from a definition up to one of them, which is left out, make of it.
  Value DecoratedBelow(const SourceFile& file, StmtId stmt, ExprId decorator);
  // What an annotation says that a value of it is.
  Value ValueOfHint(FileId file, ExprId hint, FrameId frame = kNoFrame);
  Value AttributeOf(Value receiver, Text name);
  Value IterationOf(Value iterable, bool is_async = false);
  // Without what comes from modules that are not there.
  Value WithoutForeign(Value value);
  Value ForeignMember(ClassId cls, Text name);
  // Where the name that leads to it is imported.
  Binding ImportOfForeign(uint32_t name) const;
  // What a call of the value gives.
  Value ResultOf(Value callee, std::vector<Argument>& arguments, ExprPlace place = {});
  Value ResultOfFunction(FunctionId function);
  // The function of a test's fixture that a parameter of a test, or of another fixture, is called like; kNoId without.
  FunctionId FixtureOf(const FunctionInfo& info, Text name);
  // The names that a class says by strings in `__slots__`.
  std::vector<MadeField> SlotsOf(const SourceFile& file, StmtId cls);

  // ---- names ----
  // What the name of an occurrence stands for.
  Entities EntitiesOf(const SourceFile& file, uint32_t occurrence);
  // The places that bind an entity, in order of files and offsets.
  std::vector<Binding> BindingsOf(const Entity& entity);
  // Where `def` and `class` bind a variable: the first of these places, so many.
  const std::vector<Binding>& DefinitionsOf(const SourceFile& file, uint32_t symbol);
  // The bindings that reach a name; empty for attributes.
  const std::vector<Binding>& BindingsReaching(const SourceFile& file, uint32_t occurrence,
                                               bool* may_be_unbound = nullptr);
  // The bindings of a variable that its scope is left with.
  const std::vector<Binding>& BindingsAtEnd(const SourceFile& file, uint32_t symbol);
  // The members that an attribute of this name may be, one for each type of the receiver that has it.
  std::vector<Member> MembersOf(Value receiver, Text name, uint8_t& doubt);
  // On a class only what classes have: no attribute that methods give their instances. nullptr without one.
  const Member* FindMember(ClassId cls, Text name, bool on_class = false);
  Entity EntityOfMember(const Member& member, Text name);
  Entity EntityOfVariable(const SourceFile& file, uint32_t symbol);
  // The variable of a name in a module, its star imports included.
  Entities EntitiesInModule(ModuleId module, Text name, int depth = 0);
  // The same for one of the files that say what a module holds.
  Entities EntitiesInFile(ModuleId module, FileId file, Text name, int depth = 0);
  // What the language has by a name, without an import.
  Entities EntitiesOfBuiltin(Text name);
  bool IsBuiltin(Text name);
  // Whether the stub of the builtins has a name for its own use alone.
  static bool IsOfBuiltinsStub(Text name);
  // What an import binds, followed to where it is defined.
  Entities EntitiesOfImport(const SourceFile& file, uint32_t offset, int depth = 0);
  // What `from ..module import name` means in a file, of which nothing else is looked at.
  Entities EntitiesOfImport(FileId importer, int level, Text module, Text name, int depth = 0);

  // ---- what there is ----
  ClassId ClassOfStmt(FileId file, StmtId stmt);
  ClassInfo& InfoOf(ClassId cls);              // with its bases
  ClassInfo& MembersOf(ClassId cls);           // with its members as well
  ClassId ClassNamed(Text module, Text name);  // of the library; kNoId where there is none
  FunctionId FunctionOfStmt(FileId file, StmtId stmt);
  FunctionId FunctionOfLambda(FileId file, ExprId lambda);
  FunctionInfo& function(FunctionId id) { return functions_[id]; }
  // The `def` or `class` statement in whose body a scope is, and the function of a scope; kNoId without one.
  FunctionId FunctionOfScope(const SourceFile& file, uint32_t scope);
  ClassId ClassOfScope(const SourceFile& file, uint32_t scope);
  bool IsSubclass(ClassId cls, ClassId base);
  bool IsReachable(const SourceFile& file, StmtId stmt);  // in the version and on the platform asked for
  std::string QualifiedName(ClassId cls);

  TypeTable& types() { return types_; }
  Files& files() { return files_; }
  Modules& modules() { return modules_; }
  // A file that is read. A guess pays for it, once a question: whether it was read for an earlier one, too, makes no
  // difference to it, nor whether what is sure was found in it.
  const SourceFile* FileOf(FileId file) {
    const SourceFile* source = files_.Get(file);
    if (guess_level_ == kMaxGuesses && !is_within_guess_) return source;
    if (file >= read_for_.size()) read_for_.resize(file + 1);
    if (std::exchange(read_for_[file], question_) != question_ && source != nullptr) unpaid_ += source->text().size();
    return source;
  }
  // One that a question is about: guesses do not pay for it.
  void KnowFile(FileId file) {
    if (file >= read_for_.size()) read_for_.resize(file + 1);
    read_for_[file] = question_;
  }
  // The file that says what a module holds: its stub, or its source.
  FileId FileOfModule(ModuleId module) const;
  uint32_t NumberOfName(Text name);
  Text NameOfNumber(uint32_t number) const { return names_[number]; }
  Text LiteralOf(const Type& type) const {
    return type.kind == TypeKind::kInstance && type.b != 0 ? Text(literals_[type.b - 1]) : kNoText;
  }

  TypeId InstanceOf(ClassId cls, std::span<const TypeSetId> args = {}) {
    return types_.Add(TypeKind::kInstance, cls, 0, args);
  }
  Value Just(TypeId type, uint8_t doubt = 0) { return {types_.SetOf(type), doubt}; }
  Value InstanceNamed(Text module, Text name, std::initializer_list<TypeSetId> args = {});
  Value NoneValue() { return Just(0); }
  // The class whose attributes a type has; kNoId for modules and the like.
  ClassId ClassOfType(TypeId type);

  // What parameters of a function are, for signatures.
  std::span<const ExprId> ParametersOf(const FunctionInfo& info);
  Value ValueOfParameter(FunctionId function, size_t index, FrameId frame = kNoFrame);
  ExprId HintOfParameter(const SourceFile& file, const FunctionInfo& info, size_t index);

 private:
  // What is found surely is remembered, however much it took; few questions take a tenth of this. Guesses, and what is
  // found surely for their sake, end much earlier.
  static constexpr uint32_t kMaxSteps = 20'000;
  static constexpr uint32_t kMaxGuessSteps = 3'000;
  static constexpr uint32_t kMaxStepsOfAll = 2'000'000;  // of the parts of a question, some seconds
  static constexpr int kMaxDepth = 150;
  static constexpr size_t kMaxFrames = 500'000;  // a question begins with far fewer (ByteSize)
  static constexpr int kMaxFrameDepth = 10;
  // Calls whose results are found by what they are given, inside of one another.
  static constexpr int kMaxCalls = 3;

  struct Frame {
    FunctionId function = kNoId;
    FrameId outer = kNoFrame;
    int depth = 0;
    int calls = 0;  // of which this is the innermost
    std::vector<Value> parameters;
  };
  // What was found (remembered.h).
  struct Memo {
    enum State : uint8_t { kNone, kBeingFound, kForNow, kKnown };
    Value value;
    int at = 0;  // being found: its number in finding_; good for now: the lowest number that it was found by way of
    State state = kNone;
    bool needs_level = false;
  };
  struct MemosOfLevel {
    NumberMap<Memo> found;
    std::unordered_map<uint64_t, Value> assumed;
  };
  // How many guesses are made for the sake of one another.
  static constexpr int kMaxGuesses = 3;
  struct Memos {
    NumberMap<Value> known;
    // By how many guesses are around: what is being found, and what came out otherwise if there were more.
    std::array<MemosOfLevel, kMaxGuesses + 1> levels;
  };
  struct Finding {
    Value assumed;
    bool is_met = false;
  };
  struct Found {
    Memos* memos = nullptr;
    uint64_t key = 0;
    int level = 0;
  };
  struct ModuleNames {
    std::unordered_map<Text, uint32_t> symbols;  // that the module's scope binds
    std::vector<StmtId> stars;
    bool has_all = false;
    std::vector<Text> all;  // `__all__`
  };

  // The frame in which something is evaluated, while this lives.
  class InFrame;
  // ---- remembered.h, remembered.cc ----
  // What `find()` gives, found once.
  template <class Find>
  Value Remembered(Memos& memos, uint64_t key, const Find& find);
  // What is known surely, with what was guessed of it.
  Value Guess(Value sure, Value guessed);
  // What was found for now from here on is known, or is to be found anew.
  void Settle(size_t first, bool needs_level, bool is_open);
  void ForgetForNow(size_t first);
  // Finds what was cut; whether anything was found.
  bool FindCuts();
  void FindCut(const Found& what);
  // Whether nothing more has to be found of what is to be found surely.
  bool IsInVain(Value value) const {
    return guess_level_ == kMaxGuesses && value.doubt != 0 && (value.doubt & Value::kNotYet) == 0 && !IsForeign(value);
  }
  // Whether it comes from a module that is not there, and nothing else is known of it.
  bool IsForeign(Value value) const {
    const auto types = types_.TypesOf(value.set);
    return types.size() == 1 && types_[types[0]].kind == TypeKind::kForeign;
  }
  void CountAnew() {
    steps_ = first_steps_ = std::min(kMaxSteps, steps_of_all_);
    guess_steps_ = first_guess_steps_ = std::min(kMaxGuessSteps, steps_of_all_);
    unpaid_ = 0;
    cut_rounds_ = 0;
  }
  // Makes guesses pay for the files that were read for them.
  void CountReading() {
    static constexpr uint64_t kBytesOfAStep = 240;
    if (unpaid_ == 0) return;
    guess_steps_ -= static_cast<uint32_t>(std::min<uint64_t>(guess_steps_, unpaid_ / kBytesOfAStep));
    unpaid_ = 0;
  }
  // Counts what was looked at beside values: statements, names, conditions. What no source takes that people write
  // counts as steps.
  void CountLooks(uint64_t looks) {
    static constexpr uint64_t kFree = 1024;
    static constexpr uint64_t kLooksOfAStep = 128;
    CountSteps(static_cast<int64_t>(looks));
    if (looks <= kFree) return;
    uint32_t& steps = guess_level_ == kMaxGuesses ? steps_ : guess_steps_;
    steps -= static_cast<uint32_t>(std::min<uint64_t>(steps, (looks - kFree) / kLooksOfAStep));
  }
  // What is found while this lives is found as if nothing else were being found.
  class Afresh;

  // ---- expressions.cc ----
  Value Evaluate(const SourceFile& file, ExprId expr, FrameId frame);
  Value EvaluateName(const SourceFile& file, ExprId expr, FrameId frame);
  Value EvaluateAttribute(const SourceFile& file, ExprId expr, FrameId frame);
  bool SaysItems(ClassId cls);
  Value EvaluateSubscript(const SourceFile& file, ExprId expr, FrameId frame);
  Value EvaluateCall(const SourceFile& file, ExprId expr, FrameId frame);
  Value GottenField(const SourceFile& file, std::span<const ExprId> call, FrameId frame);
  Value EvaluateBinary(const SourceFile& file, ExprId expr, FrameId frame);
  Value EvaluateString(const SourceFile& file, ExprId expr);
  Value EvaluateDict(const SourceFile& file, ExprId expr, FrameId frame);
  Value EvaluateItems(const SourceFile& file, ExprId expr, FrameId frame, Text cls);
  Value EvaluateTuple(const SourceFile& file, ExprId expr, FrameId frame);
  Value EvaluateComprehension(const SourceFile& file, ExprId expr, FrameId frame);
  Value EvaluateAwait(Value awaited);
  Value ItemOf(Value container, const SourceFile& file, std::span<const ExprId> items, FrameId frame);
  Value Operate(Value left, Value right, Text method, Text reflected);
  Value WithoutNone(Value value);
  Value WithoutDisplay(Value value);
  Value WithoutFalse(Value value, bool keeps_true);
  Value WithoutLiterals(Value value);
  Value CallMethod(Value receiver, Text name, std::initializer_list<Value> arguments, bool* has_method = nullptr);
  uint32_t LiteralNumber(Text text);
  // A copy of a source's text, for what is remembered.
  Text Kept(Text text);
  // What a display that a value came from, or the keywords of a call, have for each key: name, value.
  std::vector<std::pair<Text, Value>> EntriesOf(TypeId dict);
  static std::string TextOfEntries(const std::vector<std::pair<Text, Value>>& entries);
  Value LiteralValue(Text cls, Text text);

  // ---- variables.cc ----
  struct Reaching {
    std::vector<Binding> bindings;
    bool may_be_unbound = false;
  };
  // The bindings of a variable by where they stand, sorted.
  struct OwnBindings {
    std::vector<uint32_t> own, elsewhere, parameters, unreachable;
  };
  const OwnBindings& BindingsOfVariable(const SourceFile& file, uint32_t variable);
  OwnBindings FindBindingsOfVariable(const SourceFile& file, uint32_t variable);
  Reaching FindBindingsReaching(const SourceFile& file, uint32_t occurrence);
  std::vector<Binding> FindBindingsAtEnd(const SourceFile& file, uint32_t symbol);
  // Where a variable is given an annotation, in the version and on the platform asked for.
  const std::vector<Binding>& AnnotatedBindings(const SourceFile& file, uint32_t symbol);
  void DropImportsOfItself(const SourceFile& file, std::vector<uint32_t>& bindings);
  Value ValueOfName(const SourceFile& file, uint32_t occurrence, FrameId frame);
  Value ValueOfVariable(const SourceFile& file, uint32_t symbol, FrameId frame);
  Value ValueOfBindings(std::span<const Binding> bindings, FrameId frame);
  Value FindValueOfBinding(const SourceFile& file, uint32_t offset, FrameId frame);
  Value ValueOfTarget(const SourceFile& file, ExprId target, FrameId frame);
  Value ValueOfImport(const SourceFile& file, uint32_t offset);
  Value ForeignValue(std::string name, Binding import);
  std::string ForeignNameOf(const SourceFile& file, uint32_t offset);
  Value Unpack(const SourceFile& file, ExprId target, ExprId root, Value value, ExprPlace source, FrameId frame);
  Value ValueOfPattern(const SourceFile& file, ExprId pattern, FrameId frame);
  Value ValueMatchedBy(const SourceFile& file, ExprId pattern, FrameId frame);
  Value Entered(Value manager, bool is_async);
  Value Caught(Value type, int depth = 0);
  Value BuiltinNamed(Text name);
  Value Decorated(const SourceFile& file, StmtId stmt, Value value, FrameId frame, ExprId until = kNoExpr);
  const ModuleNames& NamesOfModule(const SourceFile& file);
  FrameId FrameFor(const SourceFile& file, uint32_t scope, FrameId frame);
  struct Puts;
  void CollectPuts(const SourceFile& file, ExprId use, Puts& puts, int depth);
  Value WithPuts(Value container, const Puts& puts);
  Value WithItemsPutInto(const SourceFile& file, ExprId target, Value held);

  // ---- entities.cc ----
  struct BoundEntities : Entities {
    bool is_bound = false;  // by anything in its file
  };
  BoundEntities FindEntitiesOfVariable(const SourceFile& file, uint32_t variable, uint32_t asked);

  // ---- narrowing.cc ----
  class Narrowing;
  // What holds, or does not, where an expression stands.
  struct Condition {
    ExprId expr;
    bool holds;
  };
  std::vector<Condition> ConditionsOf(const SourceFile& file, ExprId expr);
  std::vector<Condition> ConditionsOn(const SourceFile& file, ExprId expr);
  Value Narrowed(const SourceFile& file, ExprId expr, Value value, FrameId frame);
  // An attribute, or an item by a literal key, behind an assignment to it.
  Value Assigned(const SourceFile& file, ExprId expr, Value value, FrameId frame);
  bool IsDescribed(Value receiver, Text name);
  // Where a file writes attributes and items by literal keys, by the attribute's name or the key's text.
  const std::vector<ExprId>& WritesOf(const SourceFile& file, Text name);
  // -1 where it is not known before the program runs.
  int StaticTruth(const SourceFile& file, ExprId condition);
  int FindStaticTruth(const SourceFile& file, ExprId condition);
  // The same by what parameters are in a frame.
  int TruthIn(const SourceFile& file, ExprId condition, FrameId frame);
  int FindTruthIn(const SourceFile& file, ExprId condition, FrameId frame);
  // Of what is made of one or two conditions.
  static int CombinedTruth(const Expr& around, int left, int right);
  int Compared(Value left, Value right, CompareOperator op);
  bool IsDefinition(const SourceFile& file, ExprId expr);

  // ---- classes.cc ----
  void FindBases(ClassId cls);
  void FindFields(ClassId cls);
  void FindOrder(ClassId cls);
  void FindMembers(ClassId cls);
  void FindOutsideWrites(ClassId cls);
  void FindSlots(ClassId cls);
  ClassId MadeClass(const SourceFile& file, ExprId call, Text kind);
  void CollectTypeVars(TypeSetId set, std::vector<TypeId>& found, int depth = 0);

  // ---- attributes.cc ----
  Value AttributeOfType(TypeId type, Text name);
  bool IsDeclared(const Member& member);
  std::optional<Member> LookUpMember(ClassId cls, Text name, bool on_class);
  Value AttributeOfModule(ModuleId module, Text name);

  Value ValueOfMember(const Member& member, Text name, TypeId receiver, bool on_class);
  Value Bound(Value value, TypeId receiver, bool on_class, ClassId owner);
  Value RawValueOfMember(const Member& member, Text name);
  uint32_t FieldsGiven(ClassId cls, std::vector<Argument>& arguments);
  void SolveByFields(ClassId cls, std::vector<Argument>& arguments, Solution& solution);
  Solution SolutionFor(const Member& member, TypeId receiver);

  // ---- annotations.cc ----
  Value HintOf(const SourceFile& file, ExprId hint, FrameId frame);
  Value HintOfName(const SourceFile& file, ExprId hint, FrameId frame);
  Value HintOfSubscript(const SourceFile& file, ExprId hint, FrameId frame);
  Value HintOfValue(Value value);
  Value HintOfSpecial(SpecialForm form, const SourceFile& file, std::span<const ExprId> items, FrameId frame);
  SpecialForm SpecialFormOf(const Binding& binding, const SourceFile& file);
  Value FormOf(const SourceFile& file, ExprId target);

  // ---- functions.cc ----
  Value ResultIn(FunctionId function, FrameId frame);
  Value StatedResult(FunctionId function, FrameId frame, bool& is_stated);
  Value ReturnedIn(FunctionId function, FrameId frame);
  int IsReached(const SourceFile& file, StmtId stmt, StmtId function, FrameId frame);
  Value YieldedIn(FunctionId function, FrameId frame);
  std::vector<ExprId> YieldsOf(const FunctionInfo& info);
  // One after the other, where that is plain; empty where it is not.
  std::vector<Value> YieldedInOrder(FunctionId function, FrameId frame, int depth = 0);
  std::vector<Value> ItemsInOrder(TypeId generator, int depth);
  bool IsLeftToOthers(FunctionId function);
  std::vector<ClassId> ClassesBelow(ClassId cls);
  Value ResultBelow(FunctionId function);
  Value AttributeBelow(ClassId cls, Text name);
  Value GuessedParameter(FunctionId function, size_t index);
  Value GivenByFixture(const FunctionInfo& info, size_t index);
  Value GuessParameters(FunctionId function);
  void FindCalls(FunctionId id, std::vector<ExprPlace>& calls, int depth);
  void FindCallsOfName(const SourceFile& file, uint32_t occurrence, std::vector<ExprPlace>& calls, int depth);
  void FindCallsOfUse(const SourceFile& file, ExprId use, std::vector<ExprPlace>& calls, int depth);
  bool IsCalledBy(const SourceFile& file, ExprId decorator, FunctionId id);
  std::vector<std::pair<FunctionId, bool>> CalledFunctions(const SourceFile& file, ExprId call, ExprId argument);
  std::vector<Argument> ArgumentsBeside(const SourceFile& file, ExprId call, ExprId unknown);
  size_t ParameterGiven(const FunctionInfo& info, bool is_bound, const SourceFile& file, ExprId call, ExprId argument);
  Value ParameterOfArgument(const SourceFile& file, ExprId call, ExprId argument, size_t index);
  Value SelfOf(const FunctionInfo& info);
  // ---- docstrings.cc ----
  Value ValueInDocstring(const FunctionInfo& info, Text name);
  Value ValueOfWords(const SourceFile& file, Text words, int depth = 0);

  // ---- calls.cc ----
  Value ResultOfType(TypeId callee, std::vector<Argument>& arguments, ExprPlace place);
  Value ResultOfSpecialCall(TypeId callee, std::vector<Argument>& arguments, ExprPlace place, bool& is_special);
  Value ResultOfFunctionCall(TypeId callee, std::vector<Argument>& arguments);
  Value ResultOfClassCall(TypeId callee, std::vector<Argument>& arguments, ExprPlace place);
  std::vector<Argument> ArgumentsOf(const SourceFile& file, std::span<const ExprId> exprs, FrameId frame);
  Value ValueOfArgument(Argument& argument);
  // The argument each parameter is given, and how well they fit: below 0 not at all.
  int MatchArguments(FunctionId function, bool is_bound, std::vector<Argument>& arguments, Solution& solution,
                     std::vector<Value>* parameters);
  FrameId FrameOf(FunctionId function, FrameId outer, std::vector<Value> parameters);
  void Solve(TypeSetId hint, TypeSetId value, Solution& solution, int depth = 0);
  Value Substitute(Value value, const Solution& solution, bool drops_unsolved = false, int depth = 0);
  int Assignable(TypeSetId hint, Value value, int depth = 0);
  TypeSetId ArgsAs(TypeId type, ClassId base, size_t index);

  Files& files_;
  Modules& modules_;
  CallerSource* callers_ = nullptr;
  TypeTable types_;
  std::deque<ClassInfo> classes_;
  std::deque<FunctionInfo> functions_;
  std::deque<Frame> frames_;
  std::vector<Text> names_;
  std::deque<std::string> literals_;
  std::unordered_map<Text, uint32_t> numbers_of_names_;
  std::unordered_map<std::string, uint32_t> numbers_of_literals_;
  std::unordered_map<uint64_t, ClassId> classes_by_place_;
  std::unordered_map<uint64_t, FunctionId> functions_by_place_;
  // By the names of module and class.
  struct HashOfTexts {
    size_t operator()(const std::pair<Text, Text>& texts) const {
      return std::hash<Text>()(texts.first) * 31 + std::hash<Text>()(texts.second);
    }
  };
  std::unordered_map<std::pair<Text, Text>, ClassId, HashOfTexts> classes_by_name_;
  std::deque<Member> members_;            // that were looked up
  NumberMap<uint32_t> members_by_class_;  // by class and name, from 1; 0 where there is none
  std::unordered_map<uint64_t, std::vector<FrameId>> frames_by_hash_;
  Memos values_;    // of expressions, by file, expression and frame
  Memos bindings_;  // of bound names, by file, offset and frame
  Memos results_;   // of functions, by function and frame
  Memos hints_;     // of annotations, by file and expression
  Memos guesses_;   // of parameters, as a tuple, by function
  // What follows from sources alone, by file and occurrence, symbol or expression.
  template <class T>
  struct FoundOnce {
    std::deque<T> found;
    NumberMap<uint32_t> numbers;  // from 1
    template <class Find>
    const T& Get(FileId file, uint32_t node, const Find& find) {
      const uint64_t key = (uint64_t{file} << 32 | node) + 1;
      if (const uint32_t* known = numbers.Find(key)) return found[*known - 1];
      found.push_back(find());
      numbers.Put(key, static_cast<uint32_t>(found.size()));
      return found.back();
    }
    size_t ByteSize() const { return numbers.ByteSize() + found.size() * 2 * sizeof(T); }
  };
  FoundOnce<Reaching> reaching_;
  FoundOnce<BoundEntities> entities_;     // by symbol
  FoundOnce<OwnBindings> own_bindings_;   // by symbol
  FoundOnce<bool> is_definition_;         // by symbol
  NumberMap<int8_t> truths_;              // of conditions, by file and expression
  NumberMap<uint8_t> reachable_clauses_;  // by file and statement: bits of ClauseReach
  FoundOnce<std::vector<Binding>> at_end_;
  FoundOnce<std::vector<Binding>> annotated_;
  FoundOnce<std::vector<Binding>> definitions_;
  FoundOnce<std::vector<Condition>> conditions_;
  std::unordered_map<FileId, ModuleNames> module_names_;
  std::unordered_map<FileId, std::unordered_map<Text, std::vector<ExprId>>> writes_;
  std::unordered_map<uint32_t, Binding> imports_of_foreign_;  // by the number of the name
  TextArena texts_;
  std::unordered_set<Text> kept_;  // of texts_
  uint32_t steps_ = kMaxSteps;
  uint32_t guess_steps_ = kMaxGuessSteps;
  uint32_t first_steps_ = kMaxSteps;
  uint32_t first_guess_steps_ = kMaxGuessSteps;
  uint32_t steps_of_all_ = kMaxStepsOfAll;
  bool has_met_bound_ = false;
  uint32_t question_ = 1;           // its number
  std::vector<uint32_t> read_for_;  // by files: the last question
  bool is_within_guess_ = false;    // whether what is found surely is found for one
  uint64_t unpaid_ = 0;             // bytes of files that guesses have not paid for
  int depth_ = 0;
  int max_depth_ = kMaxDepth;
  int guess_level_ = 0;           // how many guesses are being made
  int lowest_ = INT32_MAX;        // the number of what is being found that was met again; surface_ for a cut
  int surface_ = 0;               // what has a number up to this is being found for another purpose
  bool needs_level_ = false;      // whether more guesses could have found more
  bool is_unsettled_ = false;     // whether something is not what it was assumed to be
  bool has_met_nothing_ = false;  // whether something was met of which nothing has been found yet
  bool is_finding_cuts_ = false;
  int cut_rounds_ = 0;  // of this question
  std::vector<Finding> finding_;
  std::vector<Found> for_now_;  // in the order in which they were found
  std::vector<Found> cuts_;
  int class_depth_ = 0;
  FrameId frame_ = kNoFrame;  // in which something is being evaluated
};

}  // namespace quillet
