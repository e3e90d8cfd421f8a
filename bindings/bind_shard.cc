// _host.ShardWriter: sources in, the bytes of two Parquet files out.
#include <nanobind/stl/string.h>
#include <nanobind/stl/vector.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/buffer_text.h"
#include "bindings/convert.h"
#include "bindings/decoder.h"
#include "bindings/interpreter_lock.h"
#include "bindings/language_object.h"
#include "bindings/signals.h"
#include "corpus/shard_writer.h"
#include "foundations/errors.h"

namespace quillet::host {
namespace {

class ShardWriterObject {
 public:
  ShardWriterObject(const std::vector<Language*>& languages, bool occurrences, nb::object decode, nb::object compress,
                    size_t run_rows, size_t group_rows)
      : decoder_(std::move(decode)), compress_(std::move(compress)) {
    ShardWriter::Options options;
    options.form = occurrences ? RowForm::kOccurrences : RowForm::kRecords;
    for (const Language* language : languages) options.versions.push_back(language->options());
    if (options.versions.empty()) ThrowError(ErrorKind::kValueError, "a language is needed");
    if (run_rows == 0 || group_rows == 0) ThrowError(ErrorKind::kValueError, "runs and groups have rows");
    options.decode = [this](Text bytes, std::string& utf8) { return decoder_.Decode(bytes, utf8); };
    options.compress = [this](Text bytes, std::string& compressed) { Compress(bytes, compressed); };
    options.run_rows = run_rows;
    options.group_rows = group_rows;
    writer_ = std::make_unique<ShardWriter>(std::move(options));
  }

  bool Add(nb::handle package, nb::handle archive, nb::handle path, nb::handle content, nb::handle problem) {
    const InUse in_use(*this);
    const HostText of_package = HostText::FromStr(package);
    const HostText of_archive = HostText::FromStr(archive);
    const HostText of_path = HostText::FromStr(path);
    const HostText of_content = HostText::FromStrOrBytes(content, true);
    const HostText of_problem = HostText::FromStr(problem, true);
    ShardWriter::Source source{of_package.text(), of_archive.text(), of_path.text(), {}, false, {}};
    if (!content.is_none()) source.content = of_content.text();
    if (!problem.is_none()) source.problem = of_problem.text();
    source.is_text = PyUnicode_Check(content.ptr());
    bool is_due = false;
    Run([&] { is_due = writer_->Add(source); });
    if (is_due) Run([this] { writer_->Work(); });
    return is_due;
  }

  void WorkToTheEnd() {
    const InUse in_use(*this);
    Run([this] { writer_->WorkToTheEnd(); });
  }

  void Finish(const std::string& key, const std::string& value) {
    const InUse in_use(*this);
    writer_->Finish(key, value);
  }

  nb::object TakeRows() {
    const InUse in_use(*this);
    writer_->TakeRows(taken_rows_);
    return BytesOf(taken_rows_);
  }
  nb::object TakeFiles() {
    const InUse in_use(*this);
    writer_->TakeFiles(taken_files_);
    return BytesOf(taken_files_);
  }

  nb::tuple Totals() const {
    const ShardWriter::Totals totals = writer_->totals();
    return nb::make_tuple(totals.files, totals.bytes, totals.lines, totals.rows, totals.errors, totals.problems);
  }

 private:
  // One call at a time: others wait for none, they are refused.
  class InUse {
   public:
    explicit InUse(ShardWriterObject& object) : object_(object) {
      if (object.is_in_use_) ThrowError(ErrorKind::kRuntimeError, "another call is in the middle of this shard");
      object.is_in_use_ = true;
    }
    ~InUse() { object_.is_in_use_ = false; }
    InUse(const InUse&) = delete;
    InUse& operator=(const InUse&) = delete;

   private:
    ShardWriterObject& object_;
  };

  template <class Work>
  void Run(const Work& work) {
    {
      const Unlocked unlocked;
      const ThreadStopQuestion signals(HandlesSignals());
      work();
    }
    decoder_.RaiseFailure();
  }

  void Compress(Text bytes, std::string& compressed) {
    const Locked lock;
    std::string failure;
    try {
      // A page of nothing may lie nowhere, which some compressors abort at.
      const char* const at = bytes.empty() ? "" : bytes.data();
      const nb::object view =
          nb::steal(PyMemoryView_FromMemory(const_cast<char*>(at), static_cast<Py_ssize_t>(bytes.size()), PyBUF_READ));
      if (!view.is_valid()) throw nb::python_error();
      const nb::object answer = compress_(view);
      compressed.assign(BufferText(answer).text());
      return;
    } catch (nb::python_error& error) {
      failure = decoder_.Failed(error);
    }
    ThrowError(ErrorKind::kRuntimeError, "a page cannot be compressed: " + failure);
  }

  Decoder decoder_;
  const nb::object compress_;
  bool is_in_use_ = false;  // changes with the interpreter lock held
  std::unique_ptr<ShardWriter> writer_;
  std::string taken_rows_, taken_files_;
};

}  // namespace

void BindShard(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  nb::class_<ShardWriterObject>(host, "ShardWriter", "Sources in, the bytes of two Parquet files out.")
      .def(nb::init<const std::vector<Language*>&, bool, nb::object, nb::object, size_t, size_t>(),
           nb::arg("languages"), nb::arg("occurrences"), nb::arg("decode"), nb::arg("compress"), nb::arg("run_rows"),
           nb::arg("group_rows"))
      .def("Add", &ShardWriterObject::Add, nb::arg("package"), nb::arg("source"), nb::arg("path"),
           nb::arg("content").none(), nb::arg("problem").none(),
           "Takes a source, its content as str or bytes. True where those that were held have been worked on.")
      .def("WorkToTheEnd", &ShardWriterObject::WorkToTheEnd, "Works on what is held, and writes what is left of it.")
      .def("Finish", &ShardWriterObject::Finish, nb::arg("key"), nb::arg("value"),
           "Then ends both files, with a text of their own in them.")
      .def("TakeRows", &ShardWriterObject::TakeRows, "The bytes of the file of rows since the last call.")
      .def("TakeFiles", &ShardWriterObject::TakeFiles, "The bytes of the file with a row a source since the last call.")
      .def("Totals", &ShardWriterObject::Totals,
           "(files, bytes, lines, rows, errors, problems) of what was worked on.");
}

}  // namespace quillet::host
