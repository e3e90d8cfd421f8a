// Every structure is owned by its private_data: releasing one frees what it holds and releases its
// children, unless a reader moved them away, as the interface allows.
#include "output/arrow_export.h"

#include <utility>

namespace quillet {

namespace {

// ---- schemas ----

struct OwnedSchema {
  std::string name;
  std::string format;
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
void FillSchema(std::unique_ptr<OwnedSchema> owned, ArrowSchema* schema) {
  for (ArrowSchema& child : owned->children) owned->child_pointers.push_back(&child);
  *schema = {};
  schema->format = owned->format.c_str();
  schema->name = owned->name.c_str();
  schema->n_children = static_cast<int64_t>(owned->children.size());
  schema->children = owned->child_pointers.data();
  schema->dictionary = owned->dictionary.get();
  schema->release = ReleaseSchema;
  schema->private_data = owned.release();
}

std::unique_ptr<OwnedSchema> SchemaOf(std::string name, std::string format) {
  auto schema = std::make_unique<OwnedSchema>();
  schema->name = std::move(name);
  schema->format = std::move(format);
  return schema;
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

}  // namespace

void Bits::Truncate(size_t size) {
  if (size == 0) {
    bytes_.clear();
    size_ = false_count_ = 0;
    return;
  }
  while (size_ > size) {
    --size_;
    false_count_ -= !(*this)[size_];
    if (size_ % 8 == 0)
      bytes_.pop_back();
    else
      bytes_.back() = static_cast<uint8_t>(bytes_.back() & ~(1u << size_ % 8));
  }
}

void FillTableSchema(std::span<const Column> columns, ArrowSchema* schema) {
  constexpr int64_t kNullable = 2;
  std::unique_ptr<OwnedSchema> table = SchemaOf({}, "+s");
  table->children.resize(columns.size());
  for (size_t i = 0; i < columns.size(); ++i) {
    std::unique_ptr<OwnedSchema> column = SchemaOf(columns[i].name, columns[i].format);
    if (!columns[i].dictionary.empty()) {
      column->dictionary = std::make_unique<ArrowSchema>();
      FillSchema(SchemaOf({}, columns[i].dictionary), column->dictionary.get());
    }
    FillSchema(std::move(column), &table->children[i]);
    if (columns[i].may_be_null) table->children[i].flags = kNullable;
  }
  FillSchema(std::move(table), schema);
}

void FillTableArray(const std::shared_ptr<const ColumnTable>& table, ArrowArray* array) {
  const std::vector<ColumnBuffers> columns = table->Buffers();
  auto owned = std::make_unique<OwnedArray>();
  owned->buffers = {nullptr};  // no row is null
  owned->children.resize(columns.size());
  for (size_t i = 0; i < columns.size(); ++i) {
    auto column = std::make_unique<OwnedArray>();
    column->buffers = {columns[i].validity != nullptr ? columns[i].validity->data() : nullptr};
    column->buffers.insert(column->buffers.end(), columns[i].values.begin(), columns[i].values.end());
    column->keep = table;
    if (const ColumnBuffers::Texts& texts = columns[i].dictionary; texts.offsets != nullptr) {
      auto strings = std::make_unique<OwnedArray>();
      strings->buffers = {nullptr, texts.offsets, texts.bytes};
      strings->keep = table;
      column->dictionary = std::make_unique<ArrowArray>();
      FillArray(texts.size, std::move(strings), column->dictionary.get());
    }
    FillArray(table->size(), std::move(column), &owned->children[i]);
    if (columns[i].validity != nullptr)
      owned->children[i].null_count = static_cast<int64_t>(columns[i].validity->false_count());
  }
  FillArray(table->size(), std::move(owned), array);
}

}  // namespace quillet
