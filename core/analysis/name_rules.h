// What is wrong with the names of a whole source, which none of its statements shows: asked once a source, and only
// where a row gives reason to.
#pragma once

#include <span>
#include <vector>

#include "analysis/block_rules.h"
#include "lines/cutter.h"

namespace quillet {

class NameRules {
 public:
  virtual ~NameRules() = default;
  // Adds what it finds.
  virtual void Check(const SourceText& source, std::span<const LineRow> rows,
                     std::vector<BlockRules::Finding>& findings) = 0;
};

}  // namespace quillet
