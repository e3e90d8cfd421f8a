// SyntaxReader: a source's logical lines in, its FileSyntax out.
#pragma once

#include <memory>
#include <span>

#include "lines/cutter.h"
#include "syntax/syntax.h"

namespace quillet {

// Never fails, and takes time and memory in proportion to the source. All memory is kept for the next source.
// One thread at a time.
class SyntaxReader {
 public:
  explicit SyntaxReader(Version version);
  ~SyntaxReader();
  SyntaxReader(const SyntaxReader&) = delete;
  SyntaxReader& operator=(const SyntaxReader&) = delete;

  // `out` stays valid as long as the bytes of `source` do.
  void Read(const SourceText& source, std::span<const LineRow> rows, FileSyntax& out);

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace quillet
