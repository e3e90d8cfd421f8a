// Record batches of sources in, record batches of what they say out, one source at a time on the calling thread.
//
// What is held is an input batch, the source that is its turn and one batch of output, or as many as that one
// source fills. No source fails the run: what is wrong with one is a row that says so.
// Where the version is open, a source is what it shows itself to be: of the version that reads it with the fewest
// syntax errors, the first one of a list among equals; or of Python 2 where its first line names that and it reads so.
#pragma once

#include <deque>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "analysis/file_worker.h"
#include "corpus/input_batch.h"
#include "corpus/row_tables.h"

namespace quillet {

class SourceRows {
 public:
  struct Options {
    RowForm form = RowForm::kRecords;
    // One, or several where sources decide between them: the newest first, that of Python 2 last.
    std::vector<FileAnalyzer::Options> versions;
    std::string path_column;
    std::string content_column;
    std::vector<std::string> kept_columns;
    // Texts that say why a source could not be had, null where it is there. With such a column TakeFiles gives rows.
    std::string problem_column;
    std::function<bool(Text bytes, std::string& utf8)> decode;  // as FileWorker::Options has it
    // With it, tables of so many rows with numbers for texts, as MakeRowTable has it. A table that nobody holds any
    // longer is used again.
    size_t numbered_rows = 0;
  };

  // Of all sources.
  struct Totals {
    size_t files = 0;
    size_t bytes = 0;
    size_t lines = 0;
    size_t errors = 0;
    size_t problems = 0;  // sources that could not be read
  };

  explicit SourceRows(Options options);
  SourceRows(const SourceRows&) = delete;
  SourceRows& operator=(const SourceRows&) = delete;

  // Takes the next input batch. Throws TypeError or ValueError where its columns are not those that are wanted, or
  // not those of the batches before. The batch before has to be read to its end.
  void Begin(std::unique_ptr<InputBatch> batch);
  // The next full table; null where the input batch is at its end. May be stopped (stop.h), and then begins the
  // source anew.
  std::shared_ptr<const RowTable> Next();
  // What is left over at the end of all batches; null where that is nothing.
  std::shared_ptr<const RowTable> Finish();
  // A row for each source since the last call, of the form kFiles; null where that is none.
  std::shared_ptr<const RowTable> TakeFiles();
  const Totals& totals() const { return totals_; }

 private:
  class Writer;
  class Binder;
  struct Reading {
    FileWorker::Options options;
    std::string python;  // the version in words
    std::unique_ptr<FileWorker> worker;
  };
  // Of the state between two sources.
  struct Mark {
    size_t full_tables;
    size_t rows;
  };

  void AnalyzeRow();
  BatchResult Analyze(const BatchInput& input, Reading*& reading);
  BatchResult Read(const BatchInput& input, Reading& reading);
  void AddMessages(const BatchResult& result);
  // The table that the next row goes into.
  RowTable& Room();
  // One without rows: the one that was given out last, where its memory may be used again.
  std::shared_ptr<RowTable> NewTable(RowForm form, std::shared_ptr<RowTable>& given);
  void GoBackTo(const Mark& mark);

  const Options options_;
  std::vector<Reading> readings_;
  std::unique_ptr<InputBatch> batch_;
  std::vector<InputColumn> columns_;  // that are carried, the path the last of them
  std::unique_ptr<InputColumn> content_;
  std::unique_ptr<InputColumn> problem_;  // where it is asked for
  size_t row_ = 0;
  std::vector<CarriedColumn> carried_;  // empty ones, to begin tables with
  std::deque<std::shared_ptr<RowTable>> full_;
  std::shared_ptr<RowTable> table_;
  std::shared_ptr<RowTable> files_;
  std::shared_ptr<RowTable> given_table_;
  std::shared_ptr<RowTable> given_files_;
  Totals totals_;
};

}  // namespace quillet
