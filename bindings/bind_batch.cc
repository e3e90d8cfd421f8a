// Many sources through the native path, without the interpreter lock and without an object a line.
//
// _host.NativeBatch takes sources in memory and counts their records; _host.Batch takes paths and hands
// out a result a file, or all records as a stream of columns.
#include <nanobind/stl/string.h>
#include <nanobind/stl/vector.h>

#include <memory>
#include <utility>
#include <vector>

#include "analysis/source_bytes.h"
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/file_batch.h"
#include "bindings/file_result.h"
#include "bindings/interpreter_lock.h"
#include "bindings/language_object.h"
#include "bindings/signals.h"
#include "foundations/file_status.h"
#include "output/arrow_stream.h"

namespace quillet::host {
namespace {

// ---- sources ----

class NativeBatch {
 public:
  explicit NativeBatch(Language& language) : language_(language) {}

  // The number of records and of statements rejected, over all sources.
  nb::tuple Analyze(nb::handle sources) {
    const nb::object tuple = TupleOf(sources);
    std::vector<HostText> texts;
    for (nb::handle source : nb::borrow<nb::tuple>(tuple)) texts.push_back(HostText::FromBytes(source));
    size_t records = 0;
    size_t rejected = 0;
    {
      const Language::Analyzer files(language_);
      const Unlocked unlocked;
      const ThreadStopQuestion signals(HandlesSignals());
      for (const HostText& text : texts) {
        files->Analyze(text.text());
        records += files->store().rows.size() + files->store().arg_rows.size();
        rejected += files->errors().size();
      }
    }
    return nb::make_tuple(records, rejected);
  }

 private:
  Language& language_;
};

// ---- files ----

nb::object NextOf(FileBatch& batch) {
  auto next = std::make_unique<FileResult>();
  if (!batch.Next(next->result)) return nb::none();
  return nb::cast(next.release(), nb::rv_policy::take_ownership);
}

// ---- columns ----

// Its reader calls with or without the interpreter lock.
class StreamSource : public RecordSource {
 public:
  explicit StreamSource(nb::object batch) : batch_(std::move(batch)), files_(nb::cast<FileBatch*>(batch_)) {}
  ~StreamSource() override {
    const Locked lock;
    batch_.reset();
  }

  bool Next(BatchResult& result) override {
    try {
      return files_->Next(result);
    } catch (nb::python_error& error) {
      Fail(error);
    } catch (const StoppedByHost& stopped) {
      Fail(*stopped.original);
    }
  }
  const std::vector<BatchInput>& inputs() const override { return files_->inputs(); }

 private:
  // The stream knows errors by their message alone.
  [[noreturn]] static void Fail(nb::python_error& error) {
    const Locked lock;
    const std::string message = error.what();
    error.restore();
    PyErr_Clear();
    ThrowError(ErrorKind::kRuntimeError, message);
  }

  nb::object batch_;
  FileBatch* files_;
};

constexpr const char* kStreamCapsule = "arrow_array_stream";

void ReleaseStreamCapsule(PyObject* capsule) {
  auto* stream = static_cast<ArrowArrayStream*>(PyCapsule_GetPointer(capsule, kStreamCapsule));
  if (stream->release != nullptr) stream->release(stream);
  delete stream;
}

// A capsule as the interface lays it down: a reader that takes the stream leaves it released.
using Export = void (*)(std::unique_ptr<RecordSource>, ArrowArrayStream*);
nb::object StreamCapsule(nb::object batch, Export export_stream) {
  auto stream = std::make_unique<ArrowArrayStream>();
  export_stream(std::make_unique<StreamSource>(std::move(batch)), stream.get());
  nb::object capsule = nb::steal(PyCapsule_New(stream.get(), kStreamCapsule, ReleaseStreamCapsule));
  if (!capsule.is_valid()) {
    stream->release(stream.get());
    throw nb::python_error();
  }
  static_cast<void>(stream.release());
  return capsule;
}

}  // namespace

void BindBatch(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  host.attr("MOST_BYTES_READ") = kMostBytesRead;
  host.def(
      "DeviceProblem", [](int descriptor) { return StrOf(DeviceProblem(descriptor)); }, nb::arg("descriptor"),
      "Why an open file is not to be read to its end; empty for what is no device.");
  nb::class_<NativeBatch>(host, "NativeBatch", "Sources through the native path, without an object a line.")
      .def(nb::init<Language&>(), nb::arg("language"), nb::keep_alive<1, 2>())
      .def("Analyze", &NativeBatch::Analyze, nb::arg("sources"),
           "Analyses UTF-8 sources, a sequence of bytes; gives (records, statements rejected).");
  BindFileResult(host);
  BindRecordRows(host);
  nb::class_<FileBatch>(host, "Batch", "Files through the native path, on threads without the interpreter lock.")
      .def(nb::init<const Language&, nb::handle, unsigned, nb::object, nb::object, bool>(), nb::arg("language"),
           nb::arg("inputs"), nb::arg("jobs"), nb::arg("decode"), nb::arg("format").none(), nb::arg("bindings"))
      .def("Start", &FileBatch::Start, "Sets the threads to work in front of the first Next.")
      .def("Next", &NextOf, "The next file's result, in the order of the inputs; None at the end.")
      .def_prop_ro("problems", &FileBatch::Problems)
      .def(
          "ArrowStream", [](nb::object self) { return StreamCapsule(std::move(self), ExportRecordStream); },
          "The records that were not handed out yet, as a capsule of the Arrow C stream interface.")
      .def(
          "OccurrenceStream", [](nb::object self) { return StreamCapsule(std::move(self), ExportOccurrenceStream); },
          "The same with the names of files: for a batch that binds.")
      .def("Cancel", &FileBatch::Cancel, "Stops, in the middle of a file as well.");
  nb::module_::import_("atexit").attr("register")(nb::cpp_function(&FileBatch::DismissAllThreads));
}

}  // namespace quillet::host
