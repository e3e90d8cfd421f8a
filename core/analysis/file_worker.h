// One file after the other on one thread: a source in, its records (or the lines of an output format) out.
//
// No file fails: one that cannot be read is a result that says why.
// What the core prints or reports while a file is analysed (a walk that met its limit, an internal
// failure) is collected with that file's result and printed by nobody.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "analysis/file_analyzer.h"
#include "analysis/placed_records.h"
#include "analysis/record_table.h"
#include "analysis/scope_names.h"

namespace quillet {

struct Bindings;

// A file to analyse.
struct BatchInput {
  std::string path;
  std::optional<std::string> bytes;  // the source itself, where it is at hand
  std::string problem;               // why it cannot be read, where that is known
  bool is_decoded = false;           // the bytes are UTF-8 whatever the source says of its encoding
};

// What became of a file.
struct BatchResult {
  struct Message {
    uint32_t line;    // from 1
    uint32_t column;  // from 1, in UTF-8 bytes
    std::string text;
  };

  size_t index = 0;     // of its input
  std::string problem;  // why it could not be analysed; empty where it was
  size_t byte_count = 0;
  size_t line_count = 0;       // physical lines
  size_t statement_count = 0;  // logical lines that are neither blank nor a comment
  std::vector<Message> errors;
  std::vector<Message> reports;  // of the analysis about itself
  RecordTable table;             // empty where a writer took its place
  std::string output;
  std::shared_ptr<const Bindings> bindings;  // of its names, where a binder was asked for
  size_t bindings_size = 0;                  // in bytes

  // What the result occupies, nearly.
  size_t ByteSize() const;
};

// Turns a file that was analysed into text; each thread has one.
class FileWriter {
 public:
  virtual ~FileWriter() = default;
  virtual void Write(const BatchInput& input, const FileAnalyzer& file, const ScopeNames& scopes, PlacedRecords& placed,
                     std::string& out) = 0;
  // Of the rows that it wants to see analysed; without one, all.
  virtual RowFilter* row_filter() { return nullptr; }
};

// Binds the names of a file that was analysed; each thread has one.
class FileBinder {
 public:
  virtual ~FileBinder() = default;
  virtual void Bind(const FileAnalyzer& file, BatchResult& result) = 0;
};

class FileWorker {
 public:
  struct Options {
    FileAnalyzer::Options analyzer;
    // Makes a thread's writer; without it, results carry tables.
    std::function<std::unique_ptr<FileWriter>()> make_writer;
    // Makes a thread's binder; without it, results have no bindings.
    std::function<std::unique_ptr<FileBinder>()> make_binder;
    // Decodes a source that names an encoding of its own to UTF-8: false, and the reason in `utf8`,
    // where that cannot be done. Called by any thread. Without it such a source is a problem.
    std::function<bool(Text bytes, std::string& utf8)> decode;
  };

  // `options` stay the caller's, for as long as the worker lives.
  explicit FileWorker(const Options& options);

  // Analyses a file, by a worker that is built at first need. What ends the work in the middle (stop.h) passes;
  // everything else becomes the result's problem, also that no worker can be built.
  static BatchResult AnalyzeBy(std::unique_ptr<FileWorker>& worker, const Options& options, const BatchInput& input,
                               size_t index);

  // The same in two steps: all but its table or what a writer or a binder makes of it, and these. The second one is
  // for the file of the last Read, where that had no problem.
  BatchResult Read(const BatchInput& input, size_t index);
  void Write(const BatchInput& input, BatchResult& result);

 private:
  // Why it could not be analysed, or nothing.
  std::string ReadInto(const BatchInput& input, BatchResult& result);
  void WriteInto(const BatchInput& input, BatchResult& result);
  void Describe(BatchResult& result) const;

  const Options& options_;
  FileAnalyzer file_;
  ScopeNames scopes_;
  PlacedRecords placed_;
  RecordTableMaker tables_;
  std::unique_ptr<FileWriter> writer_;
  std::unique_ptr<FileBinder> binder_;
  std::string bytes_;
};

}  // namespace quillet
