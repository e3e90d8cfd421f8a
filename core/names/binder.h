// NameBinder: a source's logical lines in, its Bindings out.
//
// The tokens are read once, statement by statement, without grammar tables: what a name does follows
// from the tokens beside it and the brackets around it. So a statement that no grammar takes is read
// like any other, and gives every name it has. It never fails, and takes time and memory in
// proportion to the source. All memory is kept for the next source. One thread at a time per binder;
// binders share nothing.
#pragma once

#include <memory>
#include <span>
#include <string>
#include <vector>

#include "lines/cutter.h"
#include "names/bindings.h"
#include "names/symbol_table.h"

namespace quillet {

// For all binders; without one, names are what they are spelled. To be called before other threads bind.
void SetNameNormalizer(NameNormalizer normalizer);

class NameBinder {
 public:
  explicit NameBinder(Version version);
  ~NameBinder();
  NameBinder(const NameBinder&) = delete;
  NameBinder& operator=(const NameBinder&) = delete;

  // The bytes are copied. What it gives stands until the next call.
  const Bindings& Bind(Text bytes);
  // For a source that was cut, by the same version.
  const Bindings& Bind(const SourceText& source, std::span<const LineRow> rows);

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace quillet
