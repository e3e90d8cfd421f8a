// Intrusive counted references for the few objects that are shared: source texts and node pools.
//
// The counter is atomic, since a source text may be read by one thread and released by another;
// what it guards is touched by one thread at a time.
#pragma once

#include <atomic>
#include <cstdint>
#include <utility>

namespace quillet {

class RefCounted {
 public:
  RefCounted() = default;
  RefCounted(const RefCounted&) = delete;
  RefCounted& operator=(const RefCounted&) = delete;

  void AddRef() const { refs_.fetch_add(1, std::memory_order_relaxed); }
  void Release() const {
    if (refs_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
  }
  // Whether there is one reference.
  bool IsUnique() const { return refs_.load(std::memory_order_acquire) == 1; }

 protected:
  virtual ~RefCounted() = default;

 private:
  mutable std::atomic<uint32_t> refs_{0};
};

template <class T>
class Ref {
 public:
  Ref() = default;
  Ref(T* object) : object_(object) {  // NOLINT(google-explicit-constructor): as a smart pointer
    if (object_) object_->AddRef();
  }
  Ref(const Ref& other) : Ref(other.object_) {}
  Ref(Ref&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
  Ref& operator=(Ref other) noexcept {
    std::swap(object_, other.object_);
    return *this;
  }
  ~Ref() {
    if (object_) object_->Release();  // NOLINT(clang-analyzer-cplusplus.NewDelete): it does not follow the count
  }

  T* get() const { return object_; }
  T* operator->() const { return object_; }
  T& operator*() const { return *object_; }
  explicit operator bool() const { return object_ != nullptr; }

 private:
  T* object_ = nullptr;
};

}  // namespace quillet
