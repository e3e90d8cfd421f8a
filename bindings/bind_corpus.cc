// _host.SourceRows: record batches of sources to record batches of rows, through capsules of the Arrow C interface.
//
// Batches come and go as the pairs of capsules that __arrow_c_array__ gives; whoever takes the structures out of a
// capsule leaves them released.
#include <nanobind/stl/string.h>
#include <nanobind/stl/unique_ptr.h>
#include <nanobind/stl/vector.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/decoder.h"
#include "bindings/interpreter_lock.h"
#include "bindings/language_object.h"
#include "bindings/signals.h"
#include "corpus/source_rows.h"
#include "foundations/errors.h"

namespace quillet::host {
namespace {

template <class Structure>
constexpr const char* kCapsuleName = nullptr;
template <>
constexpr const char* kCapsuleName<ArrowSchema> = "arrow_schema";
template <>
constexpr const char* kCapsuleName<ArrowArray> = "arrow_array";
template <>
constexpr const char* kCapsuleName<ArrowArrayStream> = "arrow_array_stream";

template <class Structure>
void ReleaseStructure(Structure& structure) {
  if (structure.release != nullptr) structure.release(&structure);
}

// A structure that is released with this, unless it was moved away.
template <class Structure>
struct Owned {
  Structure it{};
  Owned() = default;
  ~Owned() { ReleaseStructure(it); }
  Owned(const Owned&) = delete;
  Owned& operator=(const Owned&) = delete;
};

template <class Structure>
nb::object CapsuleOf(Structure&& structure) {
  auto held = std::make_unique<Structure>(structure);
  structure.release = nullptr;
  const auto release = [](PyObject* capsule) {
    auto* it = static_cast<Structure*>(PyCapsule_GetPointer(capsule, kCapsuleName<Structure>));
    ReleaseStructure(*it);
    delete it;
  };
  nb::object capsule = nb::steal(PyCapsule_New(held.get(), kCapsuleName<Structure>, release));
  if (!capsule.is_valid()) {
    ReleaseStructure(*held);
    throw nb::python_error();
  }
  static_cast<void>(held.release());
  return capsule;
}

// TypeError for anything but a capsule of such a structure, and for one that somebody has taken.
template <class Structure>
Structure& StructureIn(nb::handle capsule) {
  void* found = PyCapsule_GetPointer(capsule.ptr(), kCapsuleName<Structure>);
  if (found == nullptr) {
    PyErr_Clear();
    ThrowError(ErrorKind::kTypeError, std::string("a capsule of an ") + kCapsuleName<Structure> + " is needed");
  }
  auto& structure = *static_cast<Structure*>(found);
  if (structure.release == nullptr) ThrowError(ErrorKind::kValueError, "the capsule was read already");
  return structure;
}

nb::object ExportTable(const std::shared_ptr<const RowTable>& table) {
  if (table == nullptr) return nb::none();
  Owned<ArrowSchema> schema;
  Owned<ArrowArray> array;
  FillTableSchema(table->Schema(), &schema.it);
  FillTableArray(table, &array.it);
  return nb::make_tuple(CapsuleOf(std::move(schema.it)), CapsuleOf(std::move(array.it)));
}

class SourceRowsObject {
 public:
  // `decode` is that of a batch.
  SourceRowsObject(const std::vector<Language*>& languages, const std::string& form, std::string path,
                   std::string content, std::vector<std::string> keep, nb::object decode)
      : decoder_(std::move(decode)) {
    SourceRows::Options options;
    options.form = FormOf(form);
    for (const Language* language : languages) options.versions.push_back(language->options());
    if (options.versions.empty()) ThrowError(ErrorKind::kValueError, "a language is needed");
    options.path_column = std::move(path);
    options.content_column = std::move(content);
    options.kept_columns = std::move(keep);
    options.decode = [this](Text bytes, std::string& utf8) { return decoder_.Decode(bytes, utf8); };
    rows_ = std::make_unique<SourceRows>(std::move(options));
  }

  void Begin(nb::handle schema, nb::handle array) {
    const InUse in_use(*this);
    auto& given_schema = StructureIn<ArrowSchema>(schema);
    auto& given_array = StructureIn<ArrowArray>(array);
    rows_->Begin(std::make_unique<InputBatch>(given_schema, given_array));
  }

  nb::object Next() {
    const InUse in_use(*this);
    std::shared_ptr<const RowTable> table;
    {
      const Unlocked unlocked;
      const ThreadStopQuestion signals(HandlesSignals());
      table = rows_->Next();
    }
    decoder_.RaiseFailure();
    return ExportTable(table);
  }

  // Of a form, without those that are carried along.
  static nb::list Columns(const std::string& form) {
    nb::list columns;
    for (const Column& column : MakeRowTable(FormOf(form), {})->Schema())
      columns.append(nb::make_tuple(column.name, column.format, column.may_be_null));
    return columns;
  }

  nb::object Finish() {
    const InUse in_use(*this);
    return ExportTable(rows_->Finish());
  }

 private:
  // One call at a time: others wait for none, they are refused.
  class InUse {
   public:
    explicit InUse(SourceRowsObject& object) : object_(object) {
      if (object.is_in_use_) ThrowError(ErrorKind::kRuntimeError, "another call is in the middle of these batches");
      object.is_in_use_ = true;
    }
    ~InUse() { object_.is_in_use_ = false; }
    InUse(const InUse&) = delete;
    InUse& operator=(const InUse&) = delete;

   private:
    SourceRowsObject& object_;
  };

  static RowForm FormOf(const std::string& word) {
    if (word == "records") return RowForm::kRecords;
    if (word == "occurrences") return RowForm::kOccurrences;
    if (word == "files") return RowForm::kFiles;
    ThrowError(ErrorKind::kValueError, "no such form");
  }

  Decoder decoder_;
  bool is_in_use_ = false;  // changes with the interpreter lock held
  std::unique_ptr<SourceRows> rows_;
};

// The record batches of a stream.
class StreamBatches {
 public:
  explicit StreamBatches(nb::handle capsule) {
    auto& given = StructureIn<ArrowArrayStream>(capsule);
    stream_.it = given;
    given.release = nullptr;
  }

  // The next one as (schema, array); None at the end.
  nb::object Next() {
    Owned<ArrowSchema> schema;
    Owned<ArrowArray> array;
    Check(stream_.it.get_schema(&stream_.it, &schema.it));
    {
      const Unlocked unlocked;
      code_ = stream_.it.get_next(&stream_.it, &array.it);
    }
    Check(code_);
    if (array.it.release == nullptr) return nb::none();
    return nb::make_tuple(CapsuleOf(std::move(schema.it)), CapsuleOf(std::move(array.it)));
  }

 private:
  void Check(int code) {
    if (code == 0) return;
    const char* message = stream_.it.get_last_error(&stream_.it);
    ThrowError(ErrorKind::kOSError, message != nullptr ? message : "the stream of batches broke off");
  }

  Owned<ArrowArrayStream> stream_;
  int code_ = 0;
};

}  // namespace

void BindCorpus(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  nb::class_<SourceRowsObject>(host, "SourceRows", "Record batches of sources to record batches of what they say.")
      .def(nb::init<const std::vector<Language*>&, const std::string&, std::string, std::string,
                    std::vector<std::string>, nb::object>(),
           nb::arg("languages"), nb::arg("form"), nb::arg("path"), nb::arg("content"), nb::arg("keep"),
           nb::arg("decode"))
      .def("Begin", &SourceRowsObject::Begin, nb::arg("schema"), nb::arg("array"),
           "Takes an input batch over, as capsules.")
      .def("Next", &SourceRowsObject::Next,
           "The next full batch, as capsules of its schema and its array; None where the input batch is at its end.")
      .def_static("Columns", &SourceRowsObject::Columns, nb::arg("form"),
                  "The columns of a form behind those that are carried along, as (name, format, may be null).")
      .def("Finish", &SourceRowsObject::Finish, "The rows that are left, in the same form, or None.");
  nb::class_<StreamBatches>(host, "StreamBatches", "The record batches of a stream, from its capsule.")
      .def(nb::init<nb::handle>(), nb::arg("capsule"))
      .def("Next", &StreamBatches::Next, "The next batch as capsules of its schema and its array; None at the end.");
}

}  // namespace quillet::host
