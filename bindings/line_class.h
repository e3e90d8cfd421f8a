// What all files about CLogicalLine need of its class: objects that are asked for again and again, made once and kept.
#pragma once

#include <array>

#include "bindings/bindings.h"
#include "lines/logical_line.h"

namespace quillet::host {

inline constexpr int kLineKindCount = static_cast<int>(LineKind::kOther);

struct LineClass {
  std::array<PyObject*, kLineKindCount> kind_texts{};
  PyTypeObject* line_type = nullptr;
  struct Operation {
    PyObject* name = nullptr;
    PyObject* builtin = nullptr;  // the operation of CLogicalLine itself
  };
  Operation get_tok_type, append, append_arg, set_parsed, clear, get_exp_logicals;
};
inline LineClass g_line_class;

}  // namespace quillet::host
