// Records or names of many files as a stream of columns through the Arrow C data interface, which most
// readers of columns take without a copy: pyarrow, polars, duckdb, pandas.
//
// A batch of the stream holds the rows of whole files, as many as make a batch worth while. Its
// buffers live until the reader releases them. Columns of records:
//   path          dictionary<int32, large_utf8>    name          large_utf8
//   line, column  uint32                           kind          dictionary<int8, large_utf8>
//   scope         large_utf8                       detail        large_utf8
//                                                  is_parameter  bool
// Columns of occurrences, where receiver, kind, symbol and symbol_name may be null; the numbers of
// occurrences, scopes and symbols count in their file:
//   path                dictionary<int32, large_utf8>    index, receiver               uint32
//   line, column,                                        is_attribute                  bool
//     end_column        uint32                           scope                         uint32
//   text                large_utf8                       scope_name                    large_utf8
//   role, kind          dictionary<int8, large_utf8>     symbol                        uint32
//   a flag each         bool                             symbol_name                   large_utf8
// Strings have 64-bit offsets, since the details of one large file may pass 2 GiB.
// A dictionary has each text once and is the same in all batches (that of path has all inputs, that of
// kind all kinds): many readers group and compare by its indices, and few join dictionaries that
// differ. The scopes are not known before the last file is read, so they are plain strings.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "analysis/batch.h"
#include "output/arrow_data.h"

namespace quillet {

// Where a stream's rows come from.
class RecordSource {
 public:
  virtual ~RecordSource() = default;
  // The next file that was analysed; false at the end. An exception ends the stream with its message.
  virtual bool Next(BatchResult& result) = 0;
  // The files of all its results.
  virtual const std::vector<BatchInput>& inputs() const = 0;
};

// Each fills `stream`, which then owns the source. Its reader calls from one thread at a time.
void ExportRecordStream(std::unique_ptr<RecordSource> source, ArrowArrayStream* stream);
// For results with names; those without have no rows.
void ExportOccurrenceStream(std::unique_ptr<RecordSource> source, ArrowArrayStream* stream);

}  // namespace quillet
