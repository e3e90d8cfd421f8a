// What became of one logical line of a source: its place, and its ranges of records.
#pragma once

#include <cstdint>

#include "lines/scopes.h"

namespace quillet {

struct LineResult : LinePlace {
  uint32_t record_begin = 0, record_end = 0;          // in the store's rows
  uint32_t arg_record_begin = 0, arg_record_end = 0;  // in its arg_rows
  int32_t error = -1;                                 // index in the errors, -1 without one
};

}  // namespace quillet
