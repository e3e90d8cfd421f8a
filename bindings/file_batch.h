// A batch of files as the host has it: its decoder and its formats, called by the batch's threads.
//
// The trap: those threads may wait for the interpreter lock (to decode a source), so nothing that waits for
// them may hold it.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "analysis/batch.h"
#include "bindings/bindings.h"
#include "bindings/decoder.h"
#include "bindings/language_object.h"

namespace quillet::host {

class FileBatch {
 public:
  // Inputs are tuples (path, source or None, problem or None), all bytes. `decode` gives (UTF-8, None) or
  // (None, reason) for a source. `format` is None, one that another subsystem made, ("jsonl", errors_only), ("text",
  // errors_only, colours, width of a character), ("site survey",) or ("site page", site index).
  FileBatch(const Language& language, nb::handle inputs, unsigned jobs, nb::object decode, nb::object format,
            bool bindings);
  ~FileBatch();
  FileBatch(const FileBatch&) = delete;
  FileBatch& operator=(const FileBatch&) = delete;

  void Start() { batch_->Start(); }
  // The next result, for callers with or without the interpreter lock; false at the end. Throws what the handler
  // of a signal raised, and what is no Exception of the decoder's.
  bool Next(BatchResult& result);
  // The files so far that could not be analysed, as (index, reason), in the order in which they were handed out.
  nb::list Problems() const;
  void Cancel();
  const std::vector<BatchInput>& inputs() const { return batch_->inputs(); }

  // At the end of the interpreter: from then on no thread of a batch wants its lock any more.
  static void DismissAllThreads();

 private:
  BatchAnalyzer::Options OptionsOf(const Language& language, unsigned jobs, bool bindings);
  std::function<std::unique_ptr<FileWriter>()> WriterMaker(Version version);

  Decoder decoder_;
  nb::object format_;
  // Changes with the interpreter lock held.
  std::vector<std::pair<size_t, std::string>> problems_;
  std::unique_ptr<BatchAnalyzer> batch_;
};

}  // namespace quillet::host
