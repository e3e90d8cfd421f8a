// Statements were cut for the analysis already, so only their tokens are read.
#include "names/batch_binder.h"

namespace quillet {

namespace {

class BatchBinder : public FileBinder {
 public:
  explicit BatchBinder(Version version) : binder_(version) {}

  void Bind(const FileAnalyzer& file, BatchResult& result) override {
    // A copy holds no more memory than it needs.
    result.bindings = std::make_shared<Bindings>(binder_.Bind(file.source(), file.rows()));
    result.bindings_size = sizeof(Bindings) + result.bindings->ByteSize();
  }

 private:
  NameBinder binder_;
};

}  // namespace

std::unique_ptr<FileBinder> MakeFileBinder(Version version) { return std::make_unique<BatchBinder>(version); }

}  // namespace quillet
