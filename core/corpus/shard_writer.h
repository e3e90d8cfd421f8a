// A shard of a corpus: sources in, two Parquet files out, one with their rows and one with a row a source.
//
// Rows are sorted in runs, those about names by the name and those about sources by the path, then as they came. What
// is held is a batch of sources, the source that is its turn, the runs that are under way and what is written since
// it was taken.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "corpus/parquet_file.h"
#include "corpus/sorted_run.h"
#include "corpus/source_rows.h"

namespace quillet {

class ShardWriter {
 public:
  struct Options {
    RowForm form = RowForm::kRecords;  // or occurrences
    std::vector<FileAnalyzer::Options> versions;
    std::function<bool(Text bytes, std::string& utf8)> decode;
    ParquetFile::Compress compress;
    size_t run_rows = 0;
    size_t group_rows = 0;
  };
  // What is given stands until the end of the call that it is given to.
  struct Source {
    Text package;
    Text archive;
    Text path;
    std::optional<Text> content;
    bool is_text = false;  // UTF-8, whatever it says of its encoding
    std::optional<Text> problem;
  };
  // Of all sources so far.
  struct Totals {
    size_t files = 0;
    size_t bytes = 0;
    size_t lines = 0;
    size_t rows = 0;
    size_t errors = 0;
    size_t problems = 0;
  };

  explicit ShardWriter(Options options);
  ~ShardWriter();
  ShardWriter(const ShardWriter&) = delete;
  ShardWriter& operator=(const ShardWriter&) = delete;

  // Copies a source. True where Work is due.
  bool Add(const Source& source);
  // Analyses the sources that are held, and writes the runs that are full. May be stopped (stop.h); then there is no
  // going on.
  void Work();
  // The same, and writes what is left.
  void WorkToTheEnd();
  // Then: the end of the files; with the rows a text.
  void Finish(Text key, Text value);

  // The bytes since the last call, as ParquetFile gives them.
  void TakeRows(std::string& taken) { rows_file_->TakeBytes(taken); }
  void TakeFiles(std::string& taken) { files_file_->TakeBytes(taken); }
  Totals totals() const;

 private:
  class Sources;

  void Write(const RowTable* table, ParquetFile& file, size_t key);

  const Options options_;
  std::shared_ptr<Sources> sources_;
  std::shared_ptr<Sources> spare_;  // those before, whose memory is used again
  std::unique_ptr<SourceRows> rows_;
  std::unique_ptr<ParquetFile> rows_file_;
  std::unique_ptr<ParquetFile> files_file_;
  size_t rows_key_;
  size_t files_key_;
  SortedRun sorted_;
};

}  // namespace quillet
