// A page of character classes from the interpreter's own Unicode tables.
//
// A thread that analyses without the interpreter lock may be the first to meet a page, so the
// loader takes the lock by itself. It runs a handful of times in a process.
#include "bindings/char_tables_host.h"

#include "bindings/interpreter_lock.h"
#include "foundations/char_tables.h"

namespace quillet {

namespace {

// str.isidentifier of one or two characters; false where the host has no memory for the text.
bool IsIdentifier(const Py_UCS4* chars, Py_ssize_t count) {
  PyObject* text = PyUnicode_FromKindAndData(PyUnicode_4BYTE_KIND, chars, count);
  if (text == nullptr) {
    PyErr_Clear();
    return false;
  }
  const bool result = PyUnicode_IsIdentifier(text) == 1;
  Py_DECREF(text);
  return result;
}

uint8_t HostClassOf(Py_UCS4 code_point) {
  uint8_t classes = 0;
  if (Py_UNICODE_ISALPHA(code_point)) classes |= kCharAlpha;
  if (Py_UNICODE_ISDECIMAL(code_point)) classes |= kCharDecimal;
  if (Py_UNICODE_ISDIGIT(code_point)) classes |= kCharDigit;
  if (Py_UNICODE_ISNUMERIC(code_point)) classes |= kCharNumeric;
  if (Py_UNICODE_ISSPACE(code_point)) classes |= kCharSpace;
  if (Py_UNICODE_ISPRINTABLE(code_point)) classes |= kCharPrintable;
  const Py_UCS4 behind_letter[] = {'a', code_point};
  if (IsIdentifier(&code_point, 1)) classes |= kCharIdStart;
  if (IsIdentifier(behind_letter, 2)) classes |= kCharIdContinue;
  return classes;
}

void LoadHostPage(uint32_t first, uint8_t* classes) {
  const host::Locked lock;
  for (uint32_t i = 0; i < kCharPageSize; ++i) classes[i] = HostClassOf(first + i);
}

}  // namespace

void InstallHostCharTables() { SetCharPageLoader(LoadHostPage); }

}  // namespace quillet
