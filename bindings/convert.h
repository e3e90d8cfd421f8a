// Values between the host and the core.
//
// Token and message text is str at the host's side, records are bytes; both are UTF-8 in the core.
// Text that is not valid UTF-8 (a source may hold any bytes) reads as str with the "surrogateescape"
// handler and goes back with it, so reading never raises and the round trip is exact; other lone
// surrogates in a host's str go in as three bytes each.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/errors.h"
#include "foundations/errors.h"
#include "foundations/text.h"
#include "lines/source_text.h"
#include "tokens/token.h"
#include "tree/node_pool.h"

namespace quillet::host {

// ---- text ----

// str for text, None for none.
nb::object StrOf(Text text);
// The same for a token, whose words and operators are shared objects.
nb::object StrOfToken(const Token& token);
// bytes for text, None for none.
nb::object BytesOf(Text text);

// UTF-8 of a str or bytes of the host's, borrowed from it as long as this lives.
class HostText {
 public:
  HostText() = default;
  // Takes str only (TypeError "Expected str, got ..."), or None where `none` allows it.
  static HostText FromStr(nb::handle object, bool none = false);
  // Takes str or bytes.
  static HostText FromStrOrBytes(nb::handle object, bool none = false);
  // Takes bytes only.
  static HostText FromBytes(nb::handle object);

  Text text() const { return text_; }

 private:
  Text text_ = kNoText;
  nb::object keep_;
};

// ---- numbers and truth ----

// An argument of any type, None included: the operation itself says what it takes.
struct Any : nb::handle {};

// TypeError "an integer is required", OverflowError "value too large to convert to int".
int32_t Int32Of(nb::handle object);
int64_t Int64Of(nb::handle object);

// Keeps the host's error that is set, until ThrowTruthFailure.
void KeepTruthFailure();
[[noreturn]] void ThrowTruthFailure();

// An argument that is taken by its truth value. Where asking for that failed, using it fails: a caster
// cannot throw, and what it refuses would be a TypeError.
struct Truth {
  int8_t value = 0;  // -1 where asking failed

  operator bool() const {  // NOLINT(google-explicit-constructor): stands for a bool
    if (value < 0) [[unlikely]]
      ThrowTruthFailure();
    return value > 0;
  }
};

// A version as the host writes it; TypeError for anything but a tuple.
Version VersionOf(nb::handle object);

// ---- tokens and positions ----

// tuple(object), with the host's own error for what is no sequence.
nb::object TupleOf(nb::handle object);

// The tokens of a tuple of str and None, as tokens of a source of their own.
Ref<SourceText> SourceOfTokens(nb::handle tuple);
// Positions of a tuple of (line, column) pairs; ValueError for what is no pair.
std::vector<Position> PositionsOf(nb::handle tuple);

// The C++ object behind an instance of a bound class; null for anything else, None included.
template <class T>
T* InstanceOf(nb::handle object) {
  T* instance = nullptr;
  return nb::try_cast(object, instance, false) ? instance : nullptr;
}

// ---- contexts ----

// An int, a tuple or None; a foreign object as it was put in.
nb::object HostContext(Context context);
// The same the other way. An object that is none of these is kept in a table until the pool's node
// lets go of it; without a pool it is a TypeError.
Context CoreContext(nb::handle object, NodePool* pool);
// The context of an error: an index, of which only whether it lies in the line matters, or a pair.
Context ErrorContext(nb::handle object);

}  // namespace quillet::host

namespace nanobind::detail {

template <>
struct has_arg_defaults<quillet::host::Any> : std::true_type {};  // takes None

template <>
struct type_caster<quillet::host::Any> {
  NB_TYPE_CASTER(quillet::host::Any, const_name("object"))

  bool from_python(handle src, uint8_t, cleanup_list*) noexcept {
    static_cast<handle&>(value) = src;
    return true;
  }
  static handle from_cpp(quillet::host::Any src, rv_policy, cleanup_list*) noexcept { return src.inc_ref(); }
};

template <>
struct has_arg_defaults<quillet::host::Truth> : std::true_type {};

template <>
struct type_caster<quillet::host::Truth> {
  NB_TYPE_CASTER(quillet::host::Truth, const_name("bool"))

  bool from_python(handle src, uint8_t, cleanup_list*) noexcept {
    const int truth = PyObject_IsTrue(src.ptr());
    value.value = static_cast<int8_t>(truth);
    if (truth < 0) quillet::host::KeepTruthFailure();
    return true;
  }
  static handle from_cpp(quillet::host::Truth src, rv_policy, cleanup_list*) noexcept {
    return handle(src.value ? Py_True : Py_False).inc_ref();
  }
};

}  // namespace nanobind::detail
