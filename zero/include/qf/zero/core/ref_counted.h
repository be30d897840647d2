// Intrusive reference counting for element implementations.
//
// Counts are atomic: handles may be copied and dropped on worker threads. An object
// starts with a count of zero; the first IntrusivePtr takes it to one.
#pragma once

#include <atomic>
#include <cstddef>
#include <functional>
#include <utility>

namespace qf::zero {

// An atomic reference count kept in the object itself, for IntrusivePtr: the object deletes
// itself when the last pointer lets go.
class RefCounted {
 public:
  void addRef() const noexcept { count_.fetch_add(1, std::memory_order_relaxed); }
  void removeRef() const noexcept {
    if (count_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
  }
  long useCount() const noexcept { return count_.load(std::memory_order_relaxed); }

 protected:
  RefCounted() = default;
  RefCounted(const RefCounted&) = delete;
  RefCounted& operator=(const RefCounted&) = delete;
  virtual ~RefCounted() = default;

 private:
  mutable std::atomic<long> count_{0};
};

// Shares ownership of a RefCounted object through the count in the object, so a raw pointer
// to a live object can become an owning one again.
template <class T>
class IntrusivePtr {
 public:
  IntrusivePtr() noexcept = default;
  IntrusivePtr(std::nullptr_t) noexcept {}
  explicit IntrusivePtr(T* p) noexcept : p_(p) {
    if (p_) p_->addRef();
  }
  IntrusivePtr(const IntrusivePtr& o) noexcept : IntrusivePtr(o.p_) {}
  IntrusivePtr(IntrusivePtr&& o) noexcept : p_(std::exchange(o.p_, nullptr)) {}
  template <class U>
  IntrusivePtr(const IntrusivePtr<U>& o) noexcept : IntrusivePtr(o.get()) {}
  ~IntrusivePtr() {
    if (p_) p_->removeRef();
  }
  IntrusivePtr& operator=(IntrusivePtr o) noexcept {
    std::swap(p_, o.p_);
    return *this;
  }
  void reset(T* p = nullptr) noexcept { *this = IntrusivePtr(p); }
  T* get() const noexcept { return p_; }
  T* operator->() const noexcept { return p_; }
  T& operator*() const noexcept { return *p_; }
  explicit operator bool() const noexcept { return p_ != nullptr; }
  friend bool operator==(const IntrusivePtr& a, const IntrusivePtr& b) noexcept { return a.p_ == b.p_; }

 private:
  T* p_ = nullptr;
};

}  // namespace qf::zero

// Hashes by identity, consistent with ==.
template <class T>
struct std::hash<qf::zero::IntrusivePtr<T>> {
  std::size_t operator()(const qf::zero::IntrusivePtr<T>& p) const noexcept {
    return std::hash<T*>()(p.get());
  }
};
