// Every structure is owned by its private_data: releasing one frees what it holds and releases its
// children, unless a reader moved them away, as the interface allows.
#include "output/arrow_stream.h"

#include <array>
#include <cerrno>
#include <exception>
#include <unordered_map>
#include <utility>
#include <vector>

#include "foundations/shown_text.h"

namespace quillet {

namespace {

// Records that make a batch worth while.
constexpr size_t kBatchRows = size_t{1} << 16;

// ---- the schema ----

struct Column {
  const char* name;
  const char* format;
  bool has_dictionary;  // of large_utf8
};

constexpr Column kColumns[] = {
    {"path", "i", true},  {"line", "I", false}, {"column", "I", false}, {"scope", "U", false},
    {"name", "U", false}, {"kind", "c", true},  {"detail", "U", false}, {"is_parameter", "b", false},
};
constexpr size_t kColumnCount = std::size(kColumns);

struct OwnedSchema {
  std::vector<ArrowSchema> children;
  std::vector<ArrowSchema*> child_pointers;
  std::unique_ptr<ArrowSchema> dictionary;
};

void ReleaseSchema(ArrowSchema* schema) {
  const std::unique_ptr<OwnedSchema> owned(static_cast<OwnedSchema*>(schema->private_data));
  for (ArrowSchema& child : owned->children) {
    if (child.release != nullptr) child.release(&child);
  }
  if (owned->dictionary && owned->dictionary->release != nullptr) owned->dictionary->release(owned->dictionary.get());
  schema->release = nullptr;
}

// `owned` becomes the schema's.
void FillSchema(const char* name, const char* format, std::unique_ptr<OwnedSchema> owned, ArrowSchema* schema) {
  for (ArrowSchema& child : owned->children) owned->child_pointers.push_back(&child);
  *schema = {};
  schema->format = format;
  schema->name = name;
  schema->n_children = static_cast<int64_t>(owned->children.size());
  schema->children = owned->child_pointers.data();
  schema->dictionary = owned->dictionary.get();
  schema->release = ReleaseSchema;
  schema->private_data = owned.release();
}

void FillTableSchema(ArrowSchema* schema) {
  auto table = std::make_unique<OwnedSchema>();
  table->children.resize(kColumnCount);
  for (size_t i = 0; i < kColumnCount; ++i) {
    auto column = std::make_unique<OwnedSchema>();
    if (kColumns[i].has_dictionary) {
      column->dictionary = std::make_unique<ArrowSchema>();
      FillSchema("", "U", std::make_unique<OwnedSchema>(), column->dictionary.get());
    }
    FillSchema(kColumns[i].name, kColumns[i].format, std::move(column), &table->children[i]);
  }
  FillSchema("", "+s", std::move(table), schema);
}

// ---- arrays ----

struct OwnedArray {
  std::vector<const void*> buffers;
  std::vector<ArrowArray> children;
  std::vector<ArrowArray*> child_pointers;
  std::unique_ptr<ArrowArray> dictionary;
  std::shared_ptr<const void> keep;  // what the buffers are in
};

void ReleaseArray(ArrowArray* array) {
  const std::unique_ptr<OwnedArray> owned(static_cast<OwnedArray*>(array->private_data));
  for (ArrowArray& child : owned->children) {
    if (child.release != nullptr) child.release(&child);
  }
  if (owned->dictionary && owned->dictionary->release != nullptr) owned->dictionary->release(owned->dictionary.get());
  array->release = nullptr;
}

void FillArray(size_t length, std::unique_ptr<OwnedArray> owned, ArrowArray* array) {
  for (ArrowArray& child : owned->children) owned->child_pointers.push_back(&child);
  *array = {};
  array->length = static_cast<int64_t>(length);
  array->n_buffers = static_cast<int64_t>(owned->buffers.size());
  array->buffers = owned->buffers.data();
  array->n_children = static_cast<int64_t>(owned->children.size());
  array->children = owned->child_pointers.data();
  array->dictionary = owned->dictionary.get();
  array->release = ReleaseArray;
  array->private_data = owned.release();
}

// The dictionaries of a stream: all of its batches have the same ones, each text once.
struct Dictionaries {
  TextList paths;
  TextList kinds;
  std::vector<int32_t> path_of_input;  // index in paths

  explicit Dictionaries(const std::vector<BatchInput>& inputs) {
    std::unordered_map<std::string, int32_t> numbers;
    path_of_input.reserve(inputs.size());
    for (const BatchInput& input : inputs) {
      std::string shown;
      AppendShown(input.path, shown);
      const auto [known, is_new] = numbers.try_emplace(std::move(shown), static_cast<int32_t>(paths.size()));
      if (is_new) paths.Add(known->first);
      path_of_input.push_back(known->second);
    }
    for (const Text word : RecordKindWords()) kinds.Add(word);
  }
};

// The records of several files as columns.
struct Columns {
  std::shared_ptr<const Dictionaries> dictionaries;
  std::vector<int32_t> path_indices;
  std::vector<uint32_t> lines;
  std::vector<uint32_t> columns;
  TextList scopes;
  TextList names;
  std::vector<RecordKind> kind_indices;
  TextList details;
  std::vector<uint8_t> parameter_bits;

  explicit Columns(std::shared_ptr<const Dictionaries> shared) : dictionaries(std::move(shared)) {}

  size_t size() const { return lines.size(); }

  void Add(const BatchResult& result) {
    const RecordTable& table = result.table;
    path_indices.insert(path_indices.end(), table.size(), dictionaries->path_of_input[result.index]);
    const auto append = [](auto& to, const auto& from) { to.insert(to.end(), from.begin(), from.end()); };
    append(lines, table.lines);
    append(columns, table.columns);
    append(kind_indices, table.kinds);
    const size_t before = size() - table.size();
    parameter_bits.resize((size() + 7) / 8);
    for (size_t i = 0; i < table.size(); ++i) {
      scopes.Add(table.ScopeAt(i));
      names.Add(table.NameAt(i));
      details.Add(table.DetailAt(i));
      const size_t bit = before + i;
      if (table.is_parameter[i])
        parameter_bits[bit / 8] = static_cast<uint8_t>(parameter_bits[bit / 8] | 1u << bit % 8);
    }
  }
};

void FillTableArray(const std::shared_ptr<const Columns>& columns, ArrowArray* array) {
  auto owned = std::make_unique<OwnedArray>();
  owned->buffers = {nullptr};  // no row is null
  owned->children.resize(kColumnCount);
  size_t next = 0;
  const auto add = [&](std::vector<const void*> buffers, const TextList* dictionary = nullptr) {
    auto column = std::make_unique<OwnedArray>();
    column->buffers = {nullptr};
    column->buffers.insert(column->buffers.end(), buffers.begin(), buffers.end());
    column->keep = columns;
    if (dictionary != nullptr) {
      auto strings = std::make_unique<OwnedArray>();
      strings->buffers = {nullptr, dictionary->offsets.data(), dictionary->bytes.data()};
      strings->keep = columns;
      column->dictionary = std::make_unique<ArrowArray>();
      FillArray(dictionary->size(), std::move(strings), column->dictionary.get());
    }
    FillArray(columns->size(), std::move(column), &owned->children[next++]);
  };
  // In the order of kColumns.
  add({columns->path_indices.data()}, &columns->dictionaries->paths);
  add({columns->lines.data()});
  add({columns->columns.data()});
  add({columns->scopes.offsets.data(), columns->scopes.bytes.data()});
  add({columns->names.offsets.data(), columns->names.bytes.data()});
  add({columns->kind_indices.data()}, &columns->dictionaries->kinds);
  add({columns->details.offsets.data(), columns->details.bytes.data()});
  add({columns->parameter_bits.data()});
  FillArray(columns->size(), std::move(owned), array);
}

// ---- the stream ----

struct Stream {
  std::unique_ptr<RecordSource> source;
  std::shared_ptr<const Dictionaries> dictionaries;
  std::string error;
};

Stream& StreamOf(ArrowArrayStream* stream) { return *static_cast<Stream*>(stream->private_data); }

// Runs `function`; an exception becomes the stream's error and its code.
template <class Function>
int Guarded(ArrowArrayStream* stream, Function&& function) {
  Stream& self = StreamOf(stream);
  try {
    function(self);
    return 0;
  } catch (const std::bad_alloc&) {
    self.error = "out of memory";
    return ENOMEM;
  } catch (const std::exception& error) {
    self.error = error.what();
    return EIO;
  } catch (...) {
    self.error = "unknown failure";
    return EIO;
  }
}

int GetSchema(ArrowArrayStream* stream, ArrowSchema* out) {
  return Guarded(stream, [out](Stream&) { FillTableSchema(out); });
}

int GetNext(ArrowArrayStream* stream, ArrowArray* out) {
  return Guarded(stream, [out](Stream& self) {
    auto columns = std::make_shared<Columns>(self.dictionaries);
    BatchResult result;
    while (columns->size() < kBatchRows && self.source->Next(result)) {
      columns->Add(result);
      result = {};
    }
    *out = {};
    if (columns->size() != 0) FillTableArray(columns, out);
  });
}

const char* GetLastError(ArrowArrayStream* stream) {
  const std::string& error = StreamOf(stream).error;
  return error.empty() ? nullptr : error.c_str();
}

void ReleaseStream(ArrowArrayStream* stream) {
  delete static_cast<Stream*>(stream->private_data);
  stream->release = nullptr;
}

}  // namespace

void ExportRecordStream(std::unique_ptr<RecordSource> source, ArrowArrayStream* stream) {
  auto state = std::make_unique<Stream>();
  state->dictionaries = std::make_shared<const Dictionaries>(source->inputs());
  state->source = std::move(source);
  *stream = {GetSchema, GetNext, GetLastError, ReleaseStream, state.release()};
}

}  // namespace quillet
