// Types of values, by number.
//
// Equal types have one number, and so have equal sets of them, so that what an expression may be is one
// number as well, and asking whether two are the same compares numbers. Nothing is freed before Clear.
#pragma once

#include <algorithm>
#include <cstdint>
#include <initializer_list>
#include <span>
#include <vector>

#include "foundations/number_map.h"

namespace quillet {

using TypeId = uint32_t;
using TypeSetId = uint32_t;
inline constexpr TypeSetId kNoTypes = 0;
// Of the number of a set that a type has as an argument: it may hold others, too.
inline constexpr TypeSetId kOpenSet = TypeSetId{1} << 31;
inline constexpr TypeSetId WithoutOpen(TypeSetId set) { return set & ~kOpenSet; }

// Behind each kind what `a` and `b` are, and the arguments.
enum class TypeKind : uint8_t {
  kNone,      // the value None
  kModule,    // a: module
  kClass,     // the class itself. a: class; its type arguments, none where they are not said
  kInstance,  // a: class; b: literal + 1, or 0; its type arguments
  kTuple,     // a tuple of so many items: the items
  kFunction,  // a: function; b: frame; the receiver that it is bound to, if any
  kTypeVar,   // a: type variable
  kSuper,     // a: class behind which attributes are looked for; the receiver
  kSpecial,   // a: SpecialForm
  kTypeForm,  // an expression that is a type and no class, such as `X | None`: what it allows
  kCallable,  // b: 1 where its parameters are known; the result, the parameters...
  kForeign,   // what comes from a module that is not there; a: number of its dotted name
};

struct Type {
  TypeKind kind = TypeKind::kNone;
  uint32_t a = 0;
  uint32_t b = 0;
  uint32_t args_begin = 0;
  uint32_t args_count = 0;
  bool has_open = false;  // some argument of it, or of one, is open
};

// What an expression may be.
struct Value {
  enum Doubt : uint8_t {
    kOpen = 1,     // it may be something else too: something on the way is not known
    kGuessed = 2,  // inferred from uses, such as the calls of a function
    kNotYet = 4,   // found by way of something of which nothing has been found yet
  };
  TypeSetId set = kNoTypes;  // never with kOpenSet, which is a doubt
  uint8_t doubt = 0;

  constexpr Value() = default;
  constexpr Value(TypeSetId types, uint8_t doubts)
      : set(WithoutOpen(types)), doubt(static_cast<uint8_t>(doubts | ((types & kOpenSet) != 0 ? kOpen : 0))) {}

  // As the argument of a type.
  TypeSetId Packed() const { return set | (doubt != 0 ? kOpenSet : 0); }
  bool IsKnown() const { return set != kNoTypes; }
  friend bool operator==(const Value&, const Value&) = default;
};
inline constexpr Value kUnknownValue{kNoTypes, Value::kOpen};

// The types of a set, as a copy; of most sets without memory of its own.
class TypeList {
 public:
  explicit TypeList(std::span<const TypeId> types) : size_(types.size()) {
    if (size_ > kFew)
      many_.assign(types.begin(), types.end());
    else
      std::ranges::copy(types, few_);
  }
  const TypeId* begin() const { return size_ > kFew ? many_.data() : few_; }
  const TypeId* end() const { return begin() + size_; }
  size_t size() const { return size_; }
  bool empty() const { return size_ == 0; }
  TypeId front() const { return *begin(); }
  TypeId operator[](size_t i) const { return begin()[i]; }

 private:
  static constexpr size_t kFew = 12;

  size_t size_;
  TypeId few_[kFew];
  std::vector<TypeId> many_;
};

class TypeTable {
 public:
  // A set of more types than this is open instead.
  static constexpr size_t kMaxSet = 32;

  TypeTable() { Clear(); }

  TypeId Add(TypeKind kind, uint32_t a, uint32_t b = 0, std::span<const TypeSetId> args = {});
  TypeId Add(TypeKind kind, uint32_t a, uint32_t b, std::initializer_list<TypeSetId> args) {
    return Add(kind, a, b, std::span(args.begin(), args.size()));
  }
  const Type& operator[](TypeId type) const { return types_[type]; }
  // Valid until the next type is added.
  std::span<const TypeSetId> ArgsOf(TypeId type) const {
    return std::span(args_).subspan(types_[type].args_begin, types_[type].args_count);
  }
  TypeSetId ArgOf(TypeId type, size_t i) const {
    const TypeSetId set = i < types_[type].args_count ? args_[types_[type].args_begin + i] : kNoTypes;
    return set == kNoTypes ? kOpenSet : set;  // what is not said may be anything
  }

  TypeSetId SetOf(TypeId type) { return SetOf(std::span(&type, 1)); }
  TypeSetId SetOf(std::span<const TypeId> types);  // in any order, repeated or not
  // Valid until the next set is added: copy where evaluation goes on.
  std::span<const TypeId> TypesOf(TypeSetId set) const {
    const Set& found = sets_[WithoutOpen(set)];
    return std::span(members_).subspan(found.begin, found.count);
  }
  TypeList CopyOf(TypeSetId set) const { return TypeList(TypesOf(set)); }
  size_t SizeOf(TypeSetId set) const { return sets_[WithoutOpen(set)].count; }
  // Whether an argument of a type of it, or of one, is open.
  bool HasOpen(TypeSetId set) const;
  TypeSetId Union(TypeSetId a, TypeSetId b);
  Value Union(Value a, Value b);

  size_t size() const { return types_.size(); }
  // Roughly.
  size_t ByteSize() const {
    return types_.size() * sizeof(Type) + sets_.size() * sizeof(Set) +
           (args_.size() + members_.size()) * sizeof(uint32_t) + types_by_hash_.ByteSize() + sets_by_hash_.ByteSize() +
           unions_.ByteSize();
  }
  void Clear();

 private:
  struct Set {
    uint32_t begin, count;
  };
  bool Same(TypeId type, TypeKind kind, uint32_t a, uint32_t b, std::span<const TypeSetId> args) const;

  std::vector<Type> types_;
  std::vector<TypeSetId> args_;
  std::vector<Set> sets_;
  std::vector<TypeId> members_;
  // By hashes; the next of the same hash by one that follows from it.
  NumberMap<TypeId> types_by_hash_;
  NumberMap<TypeSetId> sets_by_hash_;
  NumberMap<TypeSetId> unions_;
  std::vector<TypeSetId> single_sets_;  // of each type alone; kNoTypes where there is none yet
};

}  // namespace quillet
