// The binder over its parts.
#include "names/binder.h"

#include <atomic>

#include "names/reader.h"
#include "names/symbol_table.h"

namespace quillet {

namespace {

std::atomic<NameNormalizer> normalizer_of_all{nullptr};

}  // namespace

void SetNameNormalizer(NameNormalizer normalizer) { normalizer_of_all.store(normalizer, std::memory_order_release); }

class NameBinder::Impl {
 public:
  explicit Impl(Version version)
      : version_(version),
        source_(SourceText::Copy(Text(""))),
        symbols_(version, bindings_),
        reader_(version, symbols_, bindings_) {}

  const Bindings& Bind(Text bytes) {
    source_->Assign(bytes);
    rows_.clear();
    CutLinesCompletely(*source_, version_, rows_);
    return Bind(*source_, rows_);
  }

  const Bindings& Bind(const SourceText& source, std::span<const LineRow> rows) {
    bindings_.Clear();
    bindings_.is_python2 = !version_.AtLeast(3, 0);
    bindings_.line_starts = source.line_starts;
    symbols_.Begin(source.size(), source.tokens.size() / 2, normalizer_of_all.load(std::memory_order_acquire));
    reader_.Read(source, rows);
    symbols_.Resolve();
    return bindings_;
  }

 private:
  Version version_;
  Ref<SourceText> source_;
  std::vector<LineRow> rows_;
  Bindings bindings_;
  SymbolTable symbols_;
  NameReader reader_;
};

NameBinder::NameBinder(Version version) : impl_(std::make_unique<Impl>(version)) {}
NameBinder::~NameBinder() = default;

const Bindings& NameBinder::Bind(Text bytes) { return impl_->Bind(bytes); }
const Bindings& NameBinder::Bind(const SourceText& source, std::span<const LineRow> rows) {
  return impl_->Bind(source, rows);
}

}  // namespace quillet
