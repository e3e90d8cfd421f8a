// Classes: their bases, the order in which attributes are looked for, and their members.
#include <algorithm>

#include "inference/inference.h"
#include "inference/remembered.h"

namespace quillet {

ClassInfo& Inference::InfoOf(ClassId cls) {
  ClassInfo& info = classes_[cls];
  if (info.has_bases || info.is_finding_bases) return info;
  static constexpr int kMaxChain = 100;
  if (class_depth_ >= kMaxChain) {  // a chain of classes longer than people write: what is above is not known
    info.is_open = true;
    info.open_from = 0;
    return info;
  }
  ++class_depth_;
  info.is_finding_bases = true;
  {
    const Afresh afresh(*this, kMaxDepth / 4);
    FindBases(cls);
    FindOrder(cls);
  }
  info.has_bases = true;
  info.is_finding_bases = false;
  --class_depth_;
  return info;
}

ClassInfo& Inference::MembersOf(ClassId cls) {
  InfoOf(cls);
  if (!classes_[cls].has_members) {
    classes_[cls].has_members = true;
    FindMembers(cls);
  }
  return classes_[cls];
}

void Inference::CollectTypeVars(TypeSetId set, std::vector<TypeId>& found, int depth) {
  static constexpr int kMaxNesting = 12;
  if (depth > kMaxNesting) return;
  for (const TypeId id : types_.CopyOf(set)) {
    if (types_[id].kind == TypeKind::kTypeVar) {
      if (std::ranges::find(found, id) == found.end()) found.push_back(id);
      continue;
    }
    if (types_[id].kind == TypeKind::kFunction) continue;
    for (size_t i = 0; i < types_[id].args_count; ++i) CollectTypeVars(types_.ArgOf(id, i), found, depth + 1);
  }
}

void Inference::FindBases(ClassId cls) {
  ClassInfo& info = classes_[cls];
  const SourceFile* file = FileOf(info.file);
  const ClassId object = ClassNamed("builtins", "object");
  if (info.stmt == kModuleStmt || file == nullptr) {
    if (info.bases.empty() && object != kNoId) info.bases.push_back({object, {}});
    return;
  }
  const FileSyntax& syntax = file->syntax;
  const Stmt& stmt = syntax.stmt(info.stmt);
  const auto add_parameter = [&](TypeId type) {
    if (std::ranges::find(info.parameters, type) == info.parameters.end()) info.parameters.push_back(type);
  };
  for (const ExprId parameter : syntax.TypeParametersOf(stmt))
    add_parameter(types_.Add(TypeKind::kTypeVar, info.file, parameter));
  std::vector<ExprId> bases;
  bool is_generic = !info.parameters.empty();
  ExprId metaclass = kNoExpr;
  for (const ExprId argument : syntax.ArgumentsOf(stmt)) {
    if (syntax[argument].kind == ExprKind::kKeyword) {
      if (syntax.NameOf(argument) == "metaclass") metaclass = syntax.ChildOf(argument, 0);
    } else if (syntax[argument].kind == ExprKind::kStarred || syntax[argument].kind == ExprKind::kDoubleStarred) {
      info.is_open = true;
    } else if (syntax[argument].kind == ExprKind::kCall &&
               syntax.NameOf(syntax.ChildOf(argument, 0)) == "with_metaclass") {
      const auto parts = syntax.ChildrenOf(argument);
      if (parts.size() > 1) metaclass = parts[1];
      for (size_t i = 2; i < parts.size(); ++i) bases.push_back(parts[i]);
    } else {
      bases.push_back(argument);
    }
  }
  for (const ExprId base : bases) {
    // `Generic[T]` and `Protocol[T]` say the order of type parameters.
    if (syntax[base].kind == ExprKind::kSubscript) {
      bool is_form = false;
      for (const TypeId id : types_.CopyOf(ValueOf(info.file, syntax.ChildOf(base, 0)).set)) {
        const Type t = types_[id];
        if (t.kind != TypeKind::kSpecial) continue;
        const auto form = static_cast<SpecialForm>(t.a);
        if (form != SpecialForm::kGeneric && form != SpecialForm::kProtocol) continue;
        is_form = true;
        if (form == SpecialForm::kProtocol) info.is_protocol = true;
        std::vector<TypeId> found;
        for (const ExprId item : syntax.ChildrenOf(base).subspan(1))
          CollectTypeVars(ValueOfHint(info.file, item).set, found);
        if (!is_generic) info.parameters = found;
        is_generic = true;
      }
      if (is_form) continue;
    }
    const Value value = ValueOf(info.file, base);
    bool is_found = false;
    for (const TypeId id : types_.CopyOf(value.set)) {
      const Type t = types_[id];
      if (t.kind == TypeKind::kSpecial) {
        const auto form = static_cast<SpecialForm>(t.a);
        is_found = form != SpecialForm::kAny;
        if (form == SpecialForm::kProtocol) info.is_protocol = true;
        if (form == SpecialForm::kTypedDict) {
          info.is_typed_dict = true;
          const ClassId fallback = ClassNamed("typing", "_TypedDict");
          if (fallback != kNoId) info.bases.push_back({fallback, {}});
        }
        if (form == SpecialForm::kNamedTuple) info.is_named_tuple = true;
        continue;
      }
      const auto add_base = [&](ClassId found, std::vector<TypeSetId> args) {
        if (found == cls || classes_[found].is_finding_bases) return;
        const bool is_there =
            std::ranges::any_of(info.bases, [&](const BaseClass& other) { return other.cls == found; });
        if (!is_there) info.bases.push_back({found, std::move(args)});
        is_found = true;
      };
      if (t.kind == TypeKind::kForeign && info.foreign_base == kNoId) info.foreign_base = t.a;
      if (t.kind == TypeKind::kClass) {
        std::vector<TypeSetId> args;
        for (size_t i = 0; i < t.args_count; ++i) args.push_back(types_.ArgOf(id, i));
        add_base(t.a, std::move(args));
      } else if (t.kind == TypeKind::kTypeForm) {  // `tuple[int, str]`
        for (const TypeId inner : types_.CopyOf(types_.ArgOf(id, 0))) {
          const ClassId found = ClassOfType(inner);
          if (found == kNoId) continue;
          std::vector<TypeSetId> args;
          for (size_t i = 0; i < types_[inner].args_count; ++i) args.push_back(types_.ArgOf(inner, i));
          if (types_[inner].kind == TypeKind::kTuple && !args.empty()) {
            Value items;
            for (const TypeSetId item : args) items = types_.Union(items, Value{item, 0});
            args = {items.Packed()};
          }
          add_base(found, std::move(args));
        }
      }
    }
    if (!is_found || (value.doubt & Value::kOpen) != 0) info.is_open = true;
  }
  if (!is_generic) {
    for (const BaseClass& base : info.bases)
      for (const TypeSetId arg : base.args) CollectTypeVars(arg, info.parameters);
  }
  for (const BaseClass& base : info.bases) {
    const ClassInfo& other = InfoOf(base.cls);
    if (other.is_enum) info.is_enum = true;
    if (other.is_typed_dict) info.is_typed_dict = true;
    if (other.is_named_tuple) info.is_named_tuple = true;
    if (other.is_dataclass) info.is_dataclass = true;
    if (info.metaclass == kNoId) info.metaclass = other.metaclass;
  }
  if (metaclass != kNoExpr) {
    for (const TypeId id : types_.CopyOf(ValueOf(info.file, metaclass).set))
      if (types_[id].kind == TypeKind::kClass) info.metaclass = types_[id].a;
  }
  if (info.name == "NamedTuple" && QualifiedName(cls) == "typing.NamedTuple") info.is_named_tuple = true;
  if (info.metaclass != kNoId && (info.name == "Enum" || info.name == "Flag") && modules_.Find("enum") != kNoModule &&
      info.file == FileOfModule(modules_.Find("enum")))
    info.is_enum = true;
  for (const ExprId decorator : syntax.DecoratorsOf(stmt)) {
    const ExprId named = syntax[decorator].kind == ExprKind::kCall ? syntax.ChildOf(decorator, 0) : decorator;
    const Text name = syntax.NameOf(named);
    if (name == "dataclass" || name == "define" || name == "frozen" || name == "mutable" || name == "attrs" ||
        (name == "s" && syntax[named].kind == ExprKind::kAttribute))
      info.is_dataclass = true;
  }
  if (info.bases.empty() && object != kNoId && object != cls) info.bases.push_back({object, {}});
}

// C3; where it gives no order, bases from left to right, each class once.
void Inference::FindOrder(ClassId cls) {
  ClassInfo& info = classes_[cls];
  std::vector<std::vector<BaseClass>> sequences;
  std::vector<size_t> open_from;
  for (const BaseClass& base : info.bases) {
    ClassInfo& other = InfoOf(base.cls);
    Solution solution;
    for (size_t i = 0; i < other.parameters.size(); ++i)
      solution.emplace_back(other.parameters[i], i < base.args.size() ? base.args[i] : kNoTypes);
    std::vector<BaseClass> order;
    for (const BaseClass& entry : other.order) {
      BaseClass substituted{entry.cls, {}};
      for (const TypeSetId arg : entry.args) substituted.args.push_back(Substitute({arg, 0}, solution).Packed());
      order.push_back(std::move(substituted));
    }
    open_from.push_back(other.open_from);
    sequences.push_back(std::move(order));
  }
  std::vector<BaseClass> direct;
  for (const auto& sequence : sequences)
    if (!sequence.empty()) direct.push_back(sequence.front());
  std::vector<TypeSetId> own;
  for (const TypeId parameter : info.parameters) own.push_back(types_.SetOf(parameter));
  info.order.clear();
  info.order.push_back({cls, std::move(own)});
  // What an unknown class may have overridden, by the classes behind it.
  std::vector<ClassId> doubtful;
  for (size_t i = 0; i < sequences.size(); ++i)
    for (size_t j = open_from[i]; j < sequences[i].size(); ++j) doubtful.push_back(sequences[i][j].cls);
  for (const BaseClass& base : info.bases)
    if (classes_[base.cls].order.empty()) info.is_open = true;
  sequences.push_back(std::move(direct));
  std::vector<size_t> heads(sequences.size(), 0);
  static constexpr size_t kMaxOrder = 400;
  while (info.order.size() < kMaxOrder) {
    const BaseClass* next = nullptr;
    const BaseClass* any = nullptr;
    for (size_t i = 0; i < sequences.size() && next == nullptr; ++i) {
      if (heads[i] >= sequences[i].size()) continue;
      const BaseClass& head = sequences[i][heads[i]];
      if (any == nullptr) any = &head;
      bool is_free = true;
      for (size_t j = 0; j < sequences.size() && is_free; ++j)
        for (size_t k = heads[j] + 1; k < sequences[j].size() && is_free; ++k)
          if (sequences[j][k].cls == head.cls) is_free = false;
      if (is_free) next = &head;
    }
    if (next == nullptr) next = any;
    if (next == nullptr) break;
    const BaseClass found = *next;
    if (std::ranges::none_of(info.order, [&](const BaseClass& entry) { return entry.cls == found.cls; }))
      info.order.push_back(found);
    for (size_t i = 0; i < sequences.size(); ++i)
      while (heads[i] < sequences[i].size() && sequences[i][heads[i]].cls == found.cls) ++heads[i];
  }
  info.open_from = info.is_open ? 1 : SIZE_MAX;
  for (size_t i = 1; i < info.order.size() && info.open_from == SIZE_MAX; ++i)
    if (std::ranges::find(doubtful, info.order[i].cls) != doubtful.end()) info.open_from = i;
}

void Inference::FindMembers(ClassId cls) {
  ClassInfo& info = classes_[cls];
  if (info.stmt == kModuleStmt || info.scope == kNoIndex) return;
  const SourceFile* file = FileOf(info.file);
  const Bindings& bindings = file->bindings;
  const FileSyntax& syntax = file->syntax;
  const uint32_t scope = info.scope;
  for (uint32_t symbol = bindings.scopes[scope].first_symbol; symbol != kNoIndex;
       symbol = bindings.symbols[symbol].next) {
    if (bindings.symbols[symbol].variable != symbol) continue;
    for (const uint32_t i : file->occurrences().Of(symbol)) {
      const Occurrence& occurrence = bindings.occurrences[i];
      // As each is spelled, `__x` and `_A__x`: attributes are not mangled.
      if (occurrence.binds()) info.symbols.emplace(Kept(bindings.TextOf(occurrence)), symbol);
    }
  }
  const Stmt& own = syntax.stmt(info.stmt);
  const auto add_written = [&](uint32_t occurrence_of_name, bool is_class) {
    const uint32_t variable =
        occurrence_of_name == kNoIndex ? kNoIndex : bindings.VariableOf(bindings.occurrences[occurrence_of_name]);
    if (variable == kNoIndex) return;
    for (const uint32_t i : file->occurrences().Of(variable)) {
      // What it is given later is something else: `self = 3`.
      if (bindings.occurrences[i].kind == NameKind::kVariable && bindings.occurrences[i].role == NameRole::kWrite &&
          i != occurrence_of_name)
        break;
      const uint32_t next = i + 1;
      if (next >= bindings.occurrences.size()) continue;
      const Occurrence& attribute = bindings.occurrences[next];
      if (!attribute.is_attribute || bindings.ReceiverOf(next) != i) continue;
      if (attribute.role != NameRole::kWrite && attribute.role != NameRole::kDefinition) continue;
      const Text name = Kept(bindings.TextOf(attribute));
      std::vector<uint32_t>& places = info.self_attributes[name];
      if (std::ranges::find(places, attribute.begin) == places.end()) places.push_back(attribute.begin);
      if (is_class) info.class_written.insert(name);
    }
  };
  // Whether a call makes an instance of the class that a name stands for: `cls(x)`, `super().__new__(cls)`.
  const auto makes_instance = [&](ExprId expr, Text class_name) {
    if (syntax[expr].kind != ExprKind::kCall) return false;
    const auto parts = syntax.ChildrenOf(expr);
    if (syntax[parts[0]].kind == ExprKind::kName) return syntax.NameOf(parts[0]) == class_name;
    return syntax[parts[0]].kind == ExprKind::kAttribute && syntax.NameOf(parts[0]) == "__new__" && parts.size() > 1 &&
           syntax[parts[1]].kind == ExprKind::kName && syntax.NameOf(parts[1]) == class_name;
  };
  // Statements of a block stand behind their owner.
  for (StmtId id = info.stmt + 1; id < syntax.stmts.size() && syntax.stmt(id).begin < own.block_end; ++id) {
    const Stmt& stmt = syntax.stmt(id);
    if (stmt.kind == StmtKind::kAnnotated || stmt.kind == StmtKind::kAssign) {
      const auto exprs = syntax.ExprsOf(stmt);
      if (stmt.parent != info.stmt || exprs.empty() || syntax[exprs[0]].kind != ExprKind::kName) continue;
      const bool is_attr = stmt.kind == StmtKind::kAssign && syntax[exprs.back()].kind == ExprKind::kCall &&
                           (syntax.NameOf(syntax.ChildOf(exprs.back(), 0)) == "ib" ||
                            syntax.NameOf(syntax.ChildOf(exprs.back(), 0)) == "attrib");
      if (stmt.kind == StmtKind::kAssign && !is_attr) continue;
      const Text hint = stmt.hint == kNoExpr ? Text() : syntax.TextOf(syntax[stmt.hint]);
      if (hint.starts_with("ClassVar") || hint.starts_with("typing.ClassVar")) continue;
      info.fields.push_back(
          {Kept(syntax.NameOf(exprs[0])), syntax[exprs[0]].begin, stmt.hint, exprs.size() > 1 ? exprs[1] : kNoExpr});
      continue;
    }
    if (stmt.kind != StmtKind::kDef) continue;
    const FunctionId function = FunctionOfStmt(info.file, id);
    if (functions_[function].cls != cls) continue;
    if ((functions_[function].flags & kIsStatic) != 0 && syntax.NameOf(stmt) != "__new__") continue;
    const auto parameters = syntax.ArgumentsOf(stmt);
    if (parameters.empty() || syntax[parameters[0]].op != static_cast<uint8_t>(ParameterKind::kPlain)) continue;
    const bool is_of_class = (functions_[function].flags & (kIsClassMethod | kIsStatic)) != 0;
    add_written(file->OccurrenceBeginningAt(syntax[parameters[0]].name_begin), is_of_class);
    if (!is_of_class) continue;
    const Text class_name = syntax.NameOf(parameters[0]);
    for (StmtId inner = id + 1; inner < syntax.stmts.size() && syntax.stmt(inner).begin < stmt.block_end; ++inner) {
      const auto exprs = syntax.ExprsOf(syntax.stmt(inner));
      if (syntax.stmt(inner).kind != StmtKind::kAssign || exprs.size() != 2) continue;
      if (syntax[exprs[0]].kind == ExprKind::kName && makes_instance(exprs[1], class_name))
        add_written(file->OccurrenceBeginningAt(syntax[exprs[0]].begin), false);
    }
  }
  FindOutsideWrites(cls);
  FindSlots(cls);
  if (info.is_dataclass || info.is_named_tuple || info.is_typed_dict) {
    std::vector<MadeField> fields;
    for (size_t i = info.bases.size(); i-- > 0;) {
      const ClassInfo& other = MembersOf(info.bases[i].cls);
      if (other.file != info.file) continue;  // a field names places of its own file
      for (const MadeField& field : other.fields) {
        const bool is_own =
            std::ranges::any_of(info.fields, [&](const MadeField& own_field) { return own_field.name == field.name; });
        if (!is_own && (other.is_dataclass || other.is_typed_dict || other.call != kNoExpr)) fields.push_back(field);
      }
    }
    info.fields.insert(info.fields.begin(), fields.begin(), fields.end());
  } else {
    info.fields.clear();
  }
}

// The names in `__slots__` that nothing else says of the class.
void Inference::FindSlots(ClassId cls) {
  ClassInfo& info = classes_[cls];
  if (!info.symbols.contains("__slots__")) return;
  for (const MadeField& slot : SlotsOf(*FileOf(info.file), info.stmt))
    if (!info.symbols.contains(slot.name) && !info.self_attributes.contains(slot.name))
      info.self_attributes[slot.name] = {slot.offset};
}

std::vector<MadeField> Inference::SlotsOf(const SourceFile& file, StmtId cls) {
  const FileSyntax& syntax = file.syntax;
  std::vector<MadeField> slots;
  const auto add = [&](ExprId string) {
    if (string == kNoExpr || syntax[string].kind != ExprKind::kString) return;
    const Text text = syntax.TextOf(syntax[string]);
    const size_t quote = text.find_first_of("'\"");
    if (quote == Text::npos || text.size() < quote + 2) return;
    const Text name = text.substr(quote + 1, text.size() - quote - 2);
    if (CodeOfText(name) != tok::NAME) return;
    slots.push_back({Kept(name), syntax[string].begin + static_cast<uint32_t>(quote) + 1, kNoExpr, kNoExpr});
  };
  for (StmtId id = syntax.stmt(cls).first_child; id != kModuleStmt; id = syntax.stmt(id).next) {
    const Stmt& stmt = syntax.stmt(id);
    const auto exprs = syntax.ExprsOf(stmt);
    if ((stmt.kind != StmtKind::kAssign && stmt.kind != StmtKind::kAnnotated) || exprs.size() != 2 ||
        syntax[exprs[0]].kind != ExprKind::kName || syntax.NameOf(exprs[0]) != "__slots__")
      continue;
    const auto items = syntax.ChildrenOf(exprs[1]);
    switch (syntax[exprs[1]].kind) {
      case ExprKind::kString:
        add(exprs[1]);
        break;
      case ExprKind::kTuple:
      case ExprKind::kList:
      case ExprKind::kSet:
        std::ranges::for_each(items, add);
        break;
      case ExprKind::kDict:
        for (size_t i = 0; i < items.size(); i += 2) add(items[i]);
        break;
      default:
        break;
    }
  }
  return slots;
}

// Attributes that its file gives the class, or what a variable was made by calling it: `C.x = 1`, `c = C(); c.x = 1`.
void Inference::FindOutsideWrites(ClassId cls) {
  ClassInfo& info = classes_[cls];
  const SourceFile* file = FileOf(info.file);
  if (file->is_stub) return;
  const FileSyntax& syntax = file->syntax;
  const Bindings& bindings = file->bindings;
  const auto variable_at = [&](ExprId expr) {
    if (expr == kNoExpr || syntax[expr].kind != ExprKind::kName) return kNoIndex;
    const uint32_t index = file->OccurrenceBeginningAt(syntax[expr].begin);
    return index == kNoIndex ? kNoIndex : bindings.VariableOf(bindings.occurrences[index]);
  };
  const uint32_t own = file->OccurrenceBeginningAt(syntax.stmt(info.stmt).name_begin);
  const uint32_t class_variable = own == kNoIndex ? kNoIndex : bindings.VariableOf(bindings.occurrences[own]);
  if (class_variable == kNoIndex) return;
  const auto add = [&](uint32_t variable, bool on_class) {
    for (const uint32_t i : file->occurrences().Of(variable)) {
      const ExprId named = syntax.NamedAt(bindings.occurrences[i].begin);
      const ExprId attribute = named == kNoExpr ? kNoExpr : syntax[named].parent;
      if (attribute == kNoExpr || syntax[attribute].kind != ExprKind::kAttribute ||
          (syntax[attribute].flags & kIsTarget) == 0 || syntax.ChildOf(attribute, 0) != named)
        continue;
      const Text name = Kept(syntax.NameOf(attribute));
      std::vector<uint32_t>& places = info.self_attributes[name];
      if (std::ranges::find(places, syntax[attribute].name_begin) == places.end())
        places.push_back(syntax[attribute].name_begin);
      if (on_class) info.class_written.insert(name);
    }
  };
  add(class_variable, true);
  std::vector<uint32_t> made;
  for (const uint32_t i : file->occurrences().Of(class_variable)) {
    const ExprId named = syntax.NamedAt(bindings.occurrences[i].begin);
    const ExprId call = named == kNoExpr ? kNoExpr : syntax[named].parent;
    if (call == kNoExpr || syntax[call].kind != ExprKind::kCall || syntax.ChildOf(call, 0) != named) continue;
    const Stmt& stmt = syntax.stmt(syntax.StatementOf(call));
    const auto exprs = syntax.ExprsOf(stmt);
    if (stmt.kind != StmtKind::kAssign || exprs.size() != 2 || exprs[1] != call) continue;
    const uint32_t variable = variable_at(exprs[0]);
    if (variable == kNoIndex || std::ranges::find(made, variable) != made.end()) continue;
    // One that is given nothing else.
    size_t count = 0;
    for (const uint32_t other : file->occurrences().Of(variable)) count += bindings.occurrences[other].binds();
    if (count == 1) made.push_back(variable);
  }
  for (const uint32_t variable : made) add(variable, false);
}

bool Inference::IsSubclass(ClassId cls, ClassId base) {
  if (cls == base) return true;
  if (cls == kNoId || base == kNoId) return false;
  return std::ranges::any_of(InfoOf(cls).order, [&](const BaseClass& entry) { return entry.cls == base; });
}

// The class that `namedtuple(...)`, `NamedTuple(...)`, `TypedDict(...)`, `Enum(...)` or `type(...)` makes.
ClassId Inference::MadeClass(const SourceFile& file, ExprId call, Text kind) {
  const uint64_t key = uint64_t{1} << 63 | uint64_t{file.id} << 32 | call;
  const auto [at, is_new] = classes_by_place_.try_emplace(key, static_cast<ClassId>(classes_.size()));
  if (!is_new) return at->second;
  const ClassId made = at->second;
  ClassInfo& info = classes_.emplace_back();
  const FileSyntax& syntax = file.syntax;
  info.file = file.id;
  info.call = call;
  const auto inner = [&](ExprId string, uint32_t& begin) {
    const Text whole = syntax.TextOf(syntax[string]);
    size_t first = 0;
    while (first < whole.size() && whole[first] != '\'' && whole[first] != '"') ++first;
    const bool is_long = whole.substr(first).starts_with("\"\"\"") || whole.substr(first).starts_with("'''");
    const size_t quote = is_long ? 3 : 1;
    if (whole.size() < first + 2 * quote) return Text();
    begin = syntax[string].begin + static_cast<uint32_t>(first + quote);
    return whole.substr(first + quote, whole.size() - first - 2 * quote);
  };
  const auto arguments = syntax.ChildrenOf(call).subspan(1);
  uint32_t begin = 0;
  if (!arguments.empty() && syntax[arguments[0]].kind == ExprKind::kString)
    info.name = Kept(inner(arguments[0], begin));
  const auto add_words = [&](ExprId string) {
    uint32_t start = 0;
    const Text text = inner(string, start);
    for (size_t i = 0; i < text.size();) {
      while (i < text.size() &&
             (text[i] == ' ' || text[i] == ',' || text[i] == '\n' || text[i] == '\t' || text[i] == '\\'))
        ++i;
      const size_t first = i;
      while (i < text.size() && text[i] != ' ' && text[i] != ',' && text[i] != '\n' && text[i] != '\t' &&
             text[i] != '\\')
        ++i;
      if (i > first)
        info.fields.push_back(
            {Kept(text.substr(first, i - first)), start + static_cast<uint32_t>(first), kNoExpr, kNoExpr});
    }
  };
  const bool has_hints = kind == "NamedTuple" || kind == "TypedDict";
  if (arguments.size() > 1) {
    ExprId fields = arguments[1];
    if (syntax[fields].kind == ExprKind::kKeyword) fields = syntax.ChildOf(fields, 0);
    if (syntax[fields].kind == ExprKind::kString) {
      add_words(fields);
    } else if (syntax[fields].kind == ExprKind::kDict) {
      const auto items = syntax.ChildrenOf(fields);
      for (size_t i = 0; i + 1 < items.size(); i += 2) {
        if (items[i] == kNoExpr || syntax[items[i]].kind != ExprKind::kString) continue;
        const Text name = Kept(inner(items[i], begin));
        info.fields.push_back({name, begin, has_hints ? items[i + 1] : kNoExpr, has_hints ? kNoExpr : items[i + 1]});
      }
    } else if (syntax[fields].kind == ExprKind::kList || syntax[fields].kind == ExprKind::kTuple) {
      for (const ExprId item : syntax.ChildrenOf(fields)) {
        if (syntax[item].kind == ExprKind::kString) {
          const Text name = Kept(inner(item, begin));
          info.fields.push_back({name, begin, kNoExpr, kNoExpr});
        } else if (syntax[item].kind == ExprKind::kTuple && syntax[item].children_count >= 2 &&
                   syntax[syntax.ChildOf(item, 0)].kind == ExprKind::kString) {
          const Text name = Kept(inner(syntax.ChildOf(item, 0), begin));
          const ExprId second = syntax.ChildOf(item, 1);
          info.fields.push_back({name, begin, has_hints ? second : kNoExpr, has_hints ? kNoExpr : second});
        }
      }
    }
  }
  ClassId base = kNoId;
  if (kind == "namedtuple" || kind == "NamedTuple") {
    info.is_named_tuple = true;
    base = ClassNamed("typing", "NamedTuple");
  } else if (kind == "TypedDict") {
    info.is_typed_dict = true;
    base = ClassNamed("typing", "_TypedDict");
  } else if (kind == "type") {
    info.is_open = true;
    info.fields.clear();
    base = ClassNamed("builtins", "object");
  } else {
    info.is_enum = true;
    base = ClassNamed("enum", kind);
  }
  if (base != kNoId) {
    info.bases.push_back({base, {}});
    const ClassId metaclass = InfoOf(base).metaclass;
    classes_[made].metaclass = metaclass;
  }
  return made;
}

}  // namespace quillet
