// Records: what a statement tells about names, as rows of two byte ranges.
//
// A row's texts are views: into the source, into the store's arena, or static. A store serves one
// line, or all lines of a file in turn; a line then owns a range of its rows.
#pragma once

#include <span>
#include <vector>

#include "foundations/arena.h"
#include "foundations/text.h"

namespace quillet {

struct Record {
  const char* name_text;
  const char* info_text;
  uint32_t name_length;
  uint32_t info_length;

  Text name() const { return {name_text, name_length}; }
  Text info() const { return {info_text, info_length}; }
};
static_assert(sizeof(Record) == 24, "two byte ranges and nothing else");

struct RecordStore {
  std::vector<Record> rows;      // facts about names of the statement's own scope
  std::vector<Record> arg_rows;  // facts about parameters of the scope the statement opens
  TextArena texts;

  void Reset() {
    rows.clear();
    arg_rows.clear();
    texts.Reset();
  }
};

}  // namespace quillet
