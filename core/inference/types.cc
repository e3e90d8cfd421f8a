// The numbering of types and sets.
#include "inference/types.h"

#include <algorithm>

namespace quillet {

namespace {

uint64_t Stir(uint64_t hash, uint64_t value) {
  hash = (hash ^ value) * 0x9E3779B97F4A7C15u;
  return hash ^ hash >> 32;
}

uint64_t NextHash(uint64_t hash) { return Stir(hash, 1) | 1; }

}  // namespace

bool TypeTable::Same(TypeId type, TypeKind kind, uint32_t a, uint32_t b, std::span<const TypeSetId> args) const {
  const Type& t = types_[type];
  return t.kind == kind && t.a == a && t.b == b && std::ranges::equal(ArgsOf(type), args);
}

TypeId TypeTable::Add(TypeKind kind, uint32_t a, uint32_t b, std::span<const TypeSetId> args) {
  uint64_t hash = Stir(Stir(Stir(0, static_cast<uint64_t>(kind)), a), b);
  for (const TypeSetId arg : args) hash = Stir(hash, arg);
  hash |= 1;
  for (const TypeId* known; (known = types_by_hash_.Find(hash)) != nullptr; hash = NextHash(hash))
    if (Same(*known, kind, a, b, args)) return *known;
  const auto id = static_cast<TypeId>(types_.size());
  const std::vector<TypeSetId> copy(args.begin(), args.end());  // `args` may be a view of args_
  bool has_open = false;
  for (const TypeSetId arg : copy) has_open = has_open || arg == kNoTypes || (arg & kOpenSet) != 0 || HasOpen(arg);
  types_.push_back({kind, a, b, static_cast<uint32_t>(args_.size()), static_cast<uint32_t>(copy.size()), has_open});
  args_.insert(args_.end(), copy.begin(), copy.end());
  types_by_hash_.Put(hash, id);
  return id;
}

TypeSetId TypeTable::SetOf(std::span<const TypeId> types) {
  if (types.empty()) return kNoTypes;
  if (types.size() == 1 && types[0] < single_sets_.size() && single_sets_[types[0]] != kNoTypes)
    return single_sets_[types[0]];
  std::vector<TypeId> sorted(types.begin(), types.end());
  std::ranges::sort(sorted);
  sorted.erase(std::unique(sorted.begin(), sorted.end()), sorted.end());
  uint64_t hash = sorted.size();
  for (const TypeId type : sorted) hash = Stir(hash, type);
  hash |= 1;
  for (const TypeSetId* known; (known = sets_by_hash_.Find(hash)) != nullptr; hash = NextHash(hash))
    if (std::ranges::equal(TypesOf(*known), sorted)) return *known;
  const auto id = static_cast<TypeSetId>(sets_.size());
  sets_.push_back({static_cast<uint32_t>(members_.size()), static_cast<uint32_t>(sorted.size())});
  members_.insert(members_.end(), sorted.begin(), sorted.end());
  sets_by_hash_.Put(hash, id);
  if (sorted.size() == 1) {
    if (sorted[0] >= single_sets_.size()) single_sets_.resize(types_.size(), kNoTypes);
    single_sets_[sorted[0]] = id;
  }
  return id;
}

bool TypeTable::HasOpen(TypeSetId set) const {
  return std::ranges::any_of(TypesOf(set), [&](TypeId type) { return types_[type].has_open; });
}

TypeSetId TypeTable::Union(TypeSetId a, TypeSetId b) {
  const TypeSetId open = (a | b) & kOpenSet;
  a = WithoutOpen(a);
  b = WithoutOpen(b);
  if (a == b || b == kNoTypes) return a | open;
  if (a == kNoTypes) return b | open;
  if (a > b) std::swap(a, b);
  const uint64_t key = uint64_t{a} << 32 | b;
  if (const TypeSetId* known = unions_.Find(key)) return *known | open;
  const auto first = TypesOf(a);
  std::vector<TypeId> all(first.begin(), first.end());
  const auto more = TypesOf(b);
  all.insert(all.end(), more.begin(), more.end());
  const TypeSetId set = SetOf(all);
  unions_.Put(key, set);
  return set | open;
}

Value TypeTable::Union(Value a, Value b) {
  const auto doubt = static_cast<uint8_t>(a.doubt | b.doubt);
  const TypeSetId set = Union(a.set, b.set);
  if (SizeOf(set) <= kMaxSet) return {set, doubt};
  return {SizeOf(a.set) >= SizeOf(b.set) ? a.set : b.set, static_cast<uint8_t>(doubt | Value::kOpen)};
}

void TypeTable::Clear() {
  types_.clear();
  args_.clear();
  members_.clear();
  types_by_hash_.Clear();
  sets_by_hash_.Clear();
  unions_.Clear();
  single_sets_.clear();
  sets_.assign(1, {0, 0});
  Add(TypeKind::kNone, 0);
}

}  // namespace quillet
