// The object behind CMatchCaseStatementParser: a parser's own, or one that the host made on it.
#pragma once

#include <cstdint>
#include <memory>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "parser/match_case_parser.h"

namespace quillet::host {

struct MatchcaseObject {
  std::shared_ptr<CMatchCaseStatementParser> parser;
  nb::object pgen_parser;  // the CPGenParserImpl object
  nb::object toks;         // what the host put in place, for the steps; null otherwise
  nb::object positions;
  Ref<SourceText> source;     // of toks
  uint64_t change_count = 0;  // the parser's, as of when it was given toks
};

nb::object NewMatchcaseObject(std::shared_ptr<CMatchCaseStatementParser> parser, nb::handle pgen_parser);

}  // namespace quillet::host
