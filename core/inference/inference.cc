// The tables of an Inference.
#include "inference/inference.h"

#include "inference/remembered.h"

namespace quillet {

Inference::Inference(Files& files, Modules& modules) : files_(files), modules_(modules) { Clear(); }
Inference::~Inference() = default;

void Inference::Clear() {
  types_.Clear();
  classes_.clear();
  functions_.clear();
  frames_.assign(1, Frame());
  names_.clear();
  numbers_of_names_.clear();
  literals_.clear();
  numbers_of_literals_.clear();
  classes_by_place_.clear();
  functions_by_place_.clear();
  classes_by_name_.clear();
  members_.clear();
  members_by_class_.Clear();
  frames_by_hash_.clear();
  for (Memos* memos : {&values_, &bindings_, &results_, &hints_, &guesses_}) *memos = {};
  reaching_ = {};
  entities_ = {};
  own_bindings_ = {};
  is_definition_ = {};
  truths_.Clear();
  reachable_clauses_.Clear();
  at_end_ = {};
  annotated_ = {};
  definitions_ = {};
  conditions_ = {};
  module_names_.clear();
  writes_.clear();
  imports_of_foreign_.clear();
  kept_.clear();
  texts_ = TextArena();
  depth_ = 0;
  max_depth_ = kMaxDepth;
  guess_level_ = surface_ = 0;
  lowest_ = INT32_MAX;
  needs_level_ = is_unsettled_ = has_met_nothing_ = is_finding_cuts_ = false;
  finding_.clear();
  for_now_.clear();
  cuts_.clear();
}

size_t Inference::ByteSize() const {
  static constexpr size_t kBytesOfANode = 56;  // of a map of small values, with its memory's head
  size_t bytes = 0;
  for (const Memos* memos : {&values_, &bindings_, &results_, &hints_, &guesses_}) {
    bytes += memos->known.ByteSize();
    for (const MemosOfLevel& level : memos->levels) bytes += level.found.ByteSize();
  }
  bytes += own_bindings_.ByteSize() + is_definition_.ByteSize() + truths_.ByteSize() + reachable_clauses_.ByteSize();
  bytes += reaching_.ByteSize() + at_end_.ByteSize() + annotated_.ByteSize() + conditions_.ByteSize();
  const size_t nodes = classes_by_place_.size() + functions_by_place_.size() + 3 * frames_by_hash_.size();
  static constexpr size_t kBytesOfAClass = 4096;  // with its members
  return nodes * kBytesOfANode + frames_.size() * 4 * sizeof(Frame) + functions_.size() * sizeof(FunctionInfo) +
         classes_.size() * kBytesOfAClass + members_.size() * sizeof(Member) + members_by_class_.ByteSize() +
         types_.ByteSize() + texts_.byte_size() + bytes;
}

Text Inference::Kept(Text text) {
  if (text.empty()) return Text("");
  if (const auto known = kept_.find(text); known != kept_.end()) return *known;
  return *kept_.insert(texts_.Copy(text)).first;
}

uint32_t Inference::NumberOfName(Text name) {
  const auto known = numbers_of_names_.find(name);
  if (known != numbers_of_names_.end()) return known->second;
  const auto number = static_cast<uint32_t>(names_.size());
  names_.push_back(Kept(name));
  numbers_of_names_.emplace(names_.back(), number);
  return number;
}

uint32_t Inference::LiteralNumber(Text text) {
  static constexpr size_t kMaxLiteral = 200;
  if (text.size() > kMaxLiteral) return 0;
  const auto [at, is_new] =
      numbers_of_literals_.try_emplace(std::string(text), static_cast<uint32_t>(literals_.size()));
  if (is_new) literals_.emplace_back(text);
  return at->second + 1;
}

FileId Inference::FileOfModule(ModuleId module) const {
  const Module& found = modules_[module];
  return found.stub != kNoFile ? found.stub : found.file;
}

ClassId Inference::ClassOfStmt(FileId file, StmtId stmt) {
  const uint64_t key = uint64_t{file} << 32 | stmt;
  const auto [at, is_new] = classes_by_place_.try_emplace(key, static_cast<ClassId>(classes_.size()));
  if (is_new) {
    const SourceFile* source = FileOf(file);
    ClassInfo& info = classes_.emplace_back();
    info.file = file;
    info.stmt = stmt;
    info.scope = source->ScopeOfStmt(stmt);
    info.name = Kept(source->syntax.NameOf(source->syntax.stmt(stmt)));
  }
  return at->second;
}

FunctionId Inference::FunctionOfStmt(FileId file, StmtId id) {
  const uint64_t key = uint64_t{file} << 32 | id;
  const auto [at, is_new] = functions_by_place_.try_emplace(key, static_cast<FunctionId>(functions_.size()));
  if (!is_new) return at->second;
  const FunctionId function = at->second;
  FunctionInfo& info = functions_.emplace_back();
  const SourceFile* source = FileOf(file);
  const FileSyntax& syntax = source->syntax;
  const Stmt& stmt = syntax.stmt(id);
  info.file = file;
  info.stmt = id;
  info.scope = source->ScopeOfStmt(id);
  if ((stmt.flags & kAsyncStmt) != 0) info.flags |= kIsAsync;
  if ((stmt.flags & kHasYield) != 0) info.flags |= kIsGenerator;
  for (const ExprId decorator : syntax.DecoratorsOf(stmt)) {
    const Text name = syntax.NameOf(decorator);
    if (name == "staticmethod" || name == "abstractstaticmethod") info.flags |= kIsStatic;
    if (name == "classmethod" || name == "abstractclassmethod") info.flags |= kIsClassMethod;
    if (name == "overload") info.flags |= kIsOverload;
    if (name == "abstractmethod" || name == "abstractproperty") info.flags |= kIsAbstract;
  }
  StmtId owner = stmt.parent;
  while (owner != kModuleStmt && syntax.stmt(owner).kind != StmtKind::kDef &&
         syntax.stmt(owner).kind != StmtKind::kClass)
    owner = syntax.stmt(owner).parent;
  if (owner != kModuleStmt && syntax.stmt(owner).kind == StmtKind::kClass) {
    const Text name = syntax.NameOf(stmt);
    if (name == "__new__") info.flags |= kIsStatic;
    if (name == "__init_subclass__" || name == "__class_getitem__") info.flags |= kIsClassMethod;
    functions_[function].cls = ClassOfStmt(file, owner);
  }
  return function;
}

FunctionId Inference::FunctionOfLambda(FileId file, ExprId lambda) {
  const uint64_t key = uint64_t{1} << 63 | uint64_t{file} << 32 | lambda;
  const auto [at, is_new] = functions_by_place_.try_emplace(key, static_cast<FunctionId>(functions_.size()));
  if (is_new) {
    FunctionInfo& info = functions_.emplace_back();
    info.file = file;
    info.lambda = lambda;
    info.scope = FileOf(file)->ScopeOfExpr(lambda);
  }
  return at->second;
}

FunctionId Inference::FunctionOfScope(const SourceFile& file, uint32_t scope) {
  switch (file.bindings.scopes[scope].kind) {
    case NameScopeKind::kFunction: {
      const StmtId stmt = file.StmtOfScope(scope);
      return stmt != kModuleStmt && file.syntax.stmt(stmt).kind == StmtKind::kDef ? FunctionOfStmt(file.id, stmt)
                                                                                  : kNoId;
    }
    case NameScopeKind::kLambda: {
      const ExprId expr = file.ExprOfScope(scope);
      return expr != kNoExpr && file.syntax[expr].kind == ExprKind::kLambda ? FunctionOfLambda(file.id, expr) : kNoId;
    }
    default:
      return kNoId;
  }
}

ClassId Inference::ClassOfScope(const SourceFile& file, uint32_t scope) {
  if (file.bindings.scopes[scope].kind != NameScopeKind::kClass) return kNoId;
  const StmtId stmt = file.StmtOfScope(scope);
  return stmt != kModuleStmt && file.syntax.stmt(stmt).kind == StmtKind::kClass ? ClassOfStmt(file.id, stmt) : kNoId;
}

std::span<const ExprId> Inference::ParametersOf(const FunctionInfo& info) {
  const SourceFile* file = FileOf(info.file);
  if (info.lambda != kNoExpr) {
    const auto children = file->syntax.ChildrenOf(info.lambda);
    return children.empty() ? children : children.first(children.size() - 1);
  }
  return file->syntax.ArgumentsOf(file->syntax.stmt(info.stmt));
}

ClassId Inference::ClassNamed(Text module, Text name) {
  if (const auto known = classes_by_name_.find({module, name}); known != classes_by_name_.end()) return known->second;
  ClassId found = kNoId;
  const ModuleId id = modules_.Find(module);
  if (id != kNoModule) {
    for (const Entity& entity : EntitiesInModule(id, name).found) {
      for (const Binding& binding : BindingsOf(entity)) {
        const SourceFile* file = FileOf(binding.file);
        const StmtId stmt = file == nullptr ? kModuleStmt : file->syntax.StatementNamedAt(binding.offset);
        if (stmt != kModuleStmt && file->syntax.stmt(stmt).kind == StmtKind::kClass && IsReachable(*file, stmt))
          found = ClassOfStmt(binding.file, stmt);
      }
    }
  }
  classes_by_name_[{Kept(module), Kept(name)}] = found;
  return found;
}

Value Inference::InstanceNamed(Text module, Text name, std::initializer_list<TypeSetId> args) {
  const ClassId cls = ClassNamed(module, name);
  return cls == kNoId ? kUnknownValue : Just(types_.Add(TypeKind::kInstance, cls, 0, args));
}

Value Inference::LiteralValue(Text cls, Text text) {
  const ClassId id = ClassNamed("builtins", cls);
  return id == kNoId ? kUnknownValue : Just(types_.Add(TypeKind::kInstance, id, LiteralNumber(text)));
}

ClassId Inference::ClassOfType(TypeId type) {
  const Type t = types_[type];
  switch (t.kind) {
    case TypeKind::kInstance:
      return t.a;
    case TypeKind::kTuple:
      return ClassNamed("builtins", "tuple");
    case TypeKind::kNone: {
      const ClassId none = ClassNamed("types", "NoneType");
      return none != kNoId ? none : ClassNamed("builtins", "object");
    }
    case TypeKind::kFunction:
    case TypeKind::kCallable:
      return ClassNamed("types", t.args_count > 0 && t.kind == TypeKind::kFunction ? "MethodType" : "FunctionType");
    case TypeKind::kClass: {
      const ClassId metaclass = InfoOf(t.a).metaclass;
      return metaclass != kNoId ? metaclass : ClassNamed("builtins", "type");
    }
    default:
      return kNoId;
  }
}

std::string Inference::QualifiedName(ClassId cls) {
  const ClassInfo& info = classes_[cls];
  const SourceFile* file = FileOf(info.file);
  std::string name(info.name);
  if (file == nullptr) return name;
  uint32_t scope =
      info.scope != kNoIndex ? file->bindings.scopes[info.scope].parent : file->ScopeAt(file->syntax[info.call].begin);
  for (; scope != kNoIndex && scope != 0; scope = file->bindings.scopes[scope].parent) {
    const NameScope& around = file->bindings.scopes[scope];
    if (around.kind != NameScopeKind::kClass && around.kind != NameScopeKind::kFunction) continue;
    name = std::string(file->bindings.NameOf(around)) + "." + name;
  }
  const ModuleId module = modules_.OfFile(info.file);
  return module == kNoModule ? name : modules_[module].name + "." + name;
}

}  // namespace quillet
