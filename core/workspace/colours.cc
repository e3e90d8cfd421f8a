// What every name of a file is: by the bindings of the file, and beyond it by what its imports lead to. Attributes of
// anything but modules are told by how they are used, which takes no inference.
#include <algorithm>

#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

bool IsWrittenAsConstant(Text name) {
  return std::ranges::any_of(name, [](char c) { return c >= 'A' && c <= 'Z'; }) &&
         std::ranges::none_of(name, [](char c) { return c >= 'a' && c <= 'z'; });
}

uint8_t ModifierIf(bool has_it, TokenModifier modifier) { return has_it ? static_cast<uint8_t>(modifier) : uint8_t{0}; }

struct Colour {
  TokenKind kind = TokenKind::kVariable;
  uint8_t modifiers = 0;
};

class Painter {
 public:
  Painter(Workspace::Impl& in, const SourceFile& file) : in_(in), file_(file), bindings_(file.bindings) {}

  ColouredName Of(uint32_t index) {
    const Occurrence& occurrence = bindings_.occurrences[index];
    Colour colour = ColourOf(index, occurrence);
    if (occurrence.binds() && occurrence.role == NameRole::kDefinition) colour.modifiers |= kTokenDeclaration;
    if (occurrence.role == NameRole::kWrite || occurrence.role == NameRole::kDelete)
      colour.modifiers |= kTokenModification;
    if ((occurrence.flags & kNameDecorator) != 0 && colour.kind == TokenKind::kFunction)
      colour.kind = TokenKind::kDecorator;
    return {occurrence.begin, bindings_.EndOf(occurrence), colour.kind, colour.modifiers};
  }

 private:
  Colour ColourOf(uint32_t index, const Occurrence& occurrence) {
    if (occurrence.role == NameRole::kKeyword) return {TokenKind::kParameter};
    if (occurrence.has_symbol) return OfVariable(bindings_.VariableOf(occurrence), occurrence);
    if (occurrence.role == NameRole::kImport) return OfImport(occurrence.begin);
    if (!occurrence.is_attribute) return {};
    const uint32_t receiver = bindings_.ReceiverOf(index);
    return OfAttribute(index, receiver != kNoIndex && IsModule(receiver));
  }

  Colour OfAttribute(uint32_t index, bool is_of_module) {
    const Occurrence& occurrence = bindings_.occurrences[index];
    if (is_of_module) {
      const Entities entities = in_.inference.EntitiesOf(file_, index);
      if (!entities.found.empty()) return OfEntity(entities.found.front());
    }
    Colour colour{occurrence.role == NameRole::kCall ? TokenKind::kMethod : TokenKind::kProperty};
    if (IsWrittenAsConstant(bindings_.TextOf(occurrence))) colour.modifiers |= kTokenReadonly;
    return colour;
  }

  // Of a chain of attributes from its first one on: each is one where the one in front is.
  bool IsModule(uint32_t index) {
    std::vector<uint32_t> chain;
    bool is_module = false;
    for (;;) {
      const Occurrence& occurrence = bindings_.occurrences[index];
      if (occurrence.has_symbol || occurrence.role == NameRole::kImport) {
        is_module = (occurrence.has_symbol     ? OfVariable(bindings_.VariableOf(occurrence), occurrence)
                     : occurrence.is_attribute ? OfImport(occurrence.begin)
                                               : Colour{})
                        .kind == TokenKind::kNamespace;
        break;
      }
      if (!occurrence.is_attribute || occurrence.role == NameRole::kKeyword) break;
      if (const auto known = is_module_.find(index); known != is_module_.end()) {
        is_module = known->second;
        break;
      }
      chain.push_back(index);
      index = bindings_.ReceiverOf(index);
      if (index == kNoIndex) break;
    }
    for (size_t i = chain.size(); i-- > 0;) {
      is_module = is_module && OfAttribute(chain[i], true).kind == TokenKind::kNamespace;
      is_module_.emplace(chain[i], is_module);
    }
    return is_module;
  }

  Colour OfVariable(uint32_t variable, const Occurrence& occurrence) {
    const auto [known, is_new] = variables_.try_emplace(variable);
    if (is_new) known->second = FindVariable(variable);
    Colour colour = known->second;
    // A name that is bound as several things is at a definition what is defined there.
    if (occurrence.kind == NameKind::kClass || occurrence.kind == NameKind::kFunction) colour = OfBinding(occurrence);
    return colour;
  }

  Colour FindVariable(uint32_t variable) {
    Colour found;
    bool is_bound = false;
    for (const uint32_t at : file_.occurrences().Of(variable)) {
      const Occurrence& occurrence = bindings_.occurrences[at];
      if (!occurrence.binds()) continue;
      const Colour colour = OfBinding(occurrence);
      if (!is_bound) found = colour;
      is_bound = true;
    }
    if (is_bound) return found;
    const Text name = bindings_.texts[bindings_.symbols[variable].name];
    if (!in_.inference.IsBuiltin(name)) return found;
    const ModuleId builtins = in_.modules.Find("builtins");
    if (builtins == kNoModule) return found;
    const Entities entities = in_.inference.EntitiesInModule(builtins, name);
    if (!entities.found.empty()) found = OfEntity(entities.found.front());
    found.modifiers |= kTokenDefaultLibrary;
    return found;
  }

  Colour OfBinding(const Occurrence& occurrence) {
    const uint32_t scope = bindings_.ScopeOf(occurrence);
    const bool in_class = scope != kNoIndex && bindings_.scopes[scope].kind == NameScopeKind::kClass;
    switch (occurrence.kind) {
      case NameKind::kClass:
        return {TokenKind::kClass};
      case NameKind::kFunction: {
        const StmtId stmt = file_.syntax.StatementNamedAt(occurrence.begin);
        const bool is_async = stmt != kModuleStmt && (file_.syntax.stmt(stmt).flags & kAsyncStmt) != 0;
        return {in_class ? TokenKind::kMethod : TokenKind::kFunction, ModifierIf(is_async, kTokenAsync)};
      }
      case NameKind::kParameter:
        return {TokenKind::kParameter};
      case NameKind::kTypeParameter:
        return {TokenKind::kTypeParameter};
      case NameKind::kTypeAlias:
        return {TokenKind::kClass};
      case NameKind::kImport:
        return OfImport(occurrence.begin);
      default:
        return {in_class ? TokenKind::kProperty : TokenKind::kVariable,
                ModifierIf(IsWrittenAsConstant(bindings_.TextOf(occurrence)), kTokenReadonly)};
    }
  }

  Colour OfImport(uint32_t offset) {
    const auto [known, is_new] = imports_.try_emplace(offset);
    if (!is_new) return known->second;
    const Entities entities = in_.inference.EntitiesOfImport(file_, offset);
    Colour colour;
    if (!entities.found.empty()) {
      colour = OfEntity(entities.found.front());
    } else {
      const ExprId named = file_.syntax.NamedAt(offset);
      const ExprId around = named == kNoExpr ? kNoExpr : file_.syntax[named].parent;
      if (around != kNoExpr && file_.syntax[around].kind == ExprKind::kModulePath) colour.kind = TokenKind::kNamespace;
    }
    imports_[offset] = colour;
    return colour;
  }

  // What it is where it is defined.
  Colour OfEntity(const Entity& entity) {
    if (entity.kind == Entity::kModule) return {TokenKind::kNamespace};
    for (const Binding& binding : in_.inference.BindingsOf(entity)) {
      const SourceFile* source = in_.Get(binding.file);
      const uint32_t at = source == nullptr ? kNoIndex : source->OccurrenceBeginningAt(binding.offset);
      if (at == kNoIndex) continue;
      const Occurrence& occurrence = source->bindings.occurrences[at];
      const bool is_member = entity.kind == Entity::kMember;
      switch (occurrence.kind) {
        case NameKind::kClass:
        case NameKind::kTypeAlias:
          return {TokenKind::kClass};
        case NameKind::kFunction:
          return {is_member ? TokenKind::kMethod : TokenKind::kFunction};
        case NameKind::kVariable:
          return {is_member ? TokenKind::kProperty : TokenKind::kVariable,
                  ModifierIf(IsWrittenAsConstant(source->bindings.TextOf(occurrence)), kTokenReadonly)};
        default:
          break;
      }
    }
    return {};
  }

  Workspace::Impl& in_;
  const SourceFile& file_;
  const Bindings& bindings_;
  std::unordered_map<uint32_t, Colour> variables_;
  std::unordered_map<uint32_t, Colour> imports_;
  std::unordered_map<uint32_t, bool> is_module_;  // by the occurrences of attributes
};

}  // namespace

std::vector<ColouredName> Workspace::Colours(FileId id, uint32_t begin, uint32_t end) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<ColouredName> names;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return names;
  Painter painter(in, *file);
  const auto& occurrences = file->bindings.occurrences;
  const auto first = std::ranges::lower_bound(occurrences, begin, {}, &Occurrence::begin);
  for (auto at = first; at != occurrences.end() && at->begin < end; ++at) {
    in.inference.BeginPart();
    const ColouredName name = painter.Of(static_cast<uint32_t>(at - occurrences.begin()));
    // Names in the string of a hint may be written by escapes; those overlap.
    if (!names.empty() && names.back().end > name.begin) continue;
    names.push_back(name);
  }
  return names;
}

}  // namespace quillet
