// A record in words: what the info half of a (name, info) pair says, as a kind and a detail, and both as
// a phrase for people.
//
// An info string that begins with ":" and a kind byte is prefixed, and what follows the prefix is its
// detail; any other is the source text of an equivalent expression. One form is told by its end instead:
// a class's name with kClassInstanceSuffix behind it means an instance of that class. docs/records.md
// shows every form.
#pragma once

#include <cstdint>
#include <span>
#include <string>

#include "foundations/text.h"

namespace quillet {

enum class RecordKind : uint8_t {
#define QUILLET_RECORD_KIND(identifier, word, info_kind) k##identifier,
#include "analysis/record_kinds.def"
};

// The words of all kinds, in their order.
std::span<const Text> RecordKindWords();

struct RecordInWords {
  RecordKind kind = RecordKind::kSet;
  Text detail;  // empty where the kind says everything
};

// Takes an info string apart. The detail is a view of it, or of the buffer where it had to be composed.
RecordInWords DecodeInfo(Text info, std::string& buffer);

// Appends kind and detail as a phrase that follows the name.
void AppendDescription(const RecordInWords& record, bool is_parameter, std::string& out);

// "<argument 0>", for a parameter that a signature comment knows by its place alone, counted from 0.
// `name` begins with kArgPrefix.
void AppendArgumentPlace(Text name, std::string& out);

}  // namespace quillet
