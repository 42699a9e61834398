// Reference-counted objects: iObject, the memory-holder interface
// iMemHolder, the shared pointer Kv::Ptr<T> and ByteBufferImpl, the holder
// of a block on the host heap.
//
// Kv::Ptr keeps its count in a separate Kv::PtrRefCount word on the host
// heap, changed through the OS() atomics; the object is deleted when a
// decrement returns 0. Copies on different threads are safe; one Ptr object
// must not be written by one thread while another reads it.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <type_traits>
#include <utility>

#include "host/HostExport.h"
#include "host/OS.h"

class HOST_API iObject : public host::HostAllocated {
 public:
  virtual ~iObject();
};

class HOST_API iMemHolder : public iObject {
 public:
  virtual unsigned char* getBuffer() const noexcept = 0;
  virtual std::size_t getSize() const noexcept = 0;  // bytes held
  virtual std::size_t getUsed() const noexcept = 0;  // bytes in use
  virtual void setUsed(std::size_t bytes) noexcept = 0;
};

namespace Kv {

struct HOST_API PtrRefCount : host::HostAllocated {
  std::atomic<int32_t> count{1};
};

template <class T>
class Ptr {
 public:
  Ptr() noexcept = default;
  Ptr(std::nullptr_t) noexcept {}  // NOLINT(google-explicit-constructor)
  // Takes ownership of a freshly made object.
  explicit Ptr(T* object) : object_(object) {
    if (object_) {
      try {
        count_ = new PtrRefCount;
      } catch (...) {
        delete object;
        throw;
      }
    }
  }
  Ptr(const Ptr& other) noexcept : object_(other.object_), count_(other.count_) { retain(); }
  Ptr(Ptr&& other) noexcept
      : object_(std::exchange(other.object_, nullptr)), count_(std::exchange(other.count_, nullptr)) {}
  template <class U, class = std::enable_if_t<std::is_convertible_v<U*, T*>>>
  Ptr(const Ptr<U>& other) noexcept  // NOLINT(google-explicit-constructor)
      : object_(other.object_), count_(other.count_) {
    retain();
  }
  ~Ptr() { release(); }

  Ptr& operator=(const Ptr& other) noexcept {
    Ptr(other).swap(*this);
    return *this;
  }
  Ptr& operator=(Ptr&& other) noexcept {
    Ptr(std::move(other)).swap(*this);
    return *this;
  }
  Ptr& operator=(std::nullptr_t) noexcept {
    reset();
    return *this;
  }

  void reset() noexcept { Ptr().swap(*this); }
  void swap(Ptr& other) noexcept {
    std::swap(object_, other.object_);
    std::swap(count_, other.count_);
  }

  T* get() const noexcept { return object_; }
  T* operator->() const noexcept { return object_; }
  T& operator*() const noexcept { return *object_; }
  explicit operator bool() const noexcept { return object_ != nullptr; }
  int32_t useCount() const noexcept { return count_ ? count_->count.load() : 0; }

  friend bool operator==(const Ptr& a, const Ptr& b) noexcept { return a.object_ == b.object_; }
  friend bool operator==(const Ptr& a, std::nullptr_t) noexcept { return a.object_ == nullptr; }

 private:
  template <class U>
  friend class Ptr;

  void retain() noexcept {
    if (count_) OS()->atomics()->atomicIncrement(count_->count);
  }
  void release() noexcept {
    if (count_ && OS()->atomics()->atomicDecrement(count_->count) == 0) {
      delete object_;
      delete count_;
    }
    object_ = nullptr;
    count_ = nullptr;
  }

  T* object_ = nullptr;
  PtrRefCount* count_ = nullptr;
};

}  // namespace Kv

// An iMemHolder over a block of the host heap; the block is zero-filled and
// all of it counts as used until setUsed says otherwise.
class HOST_API ByteBufferImpl : public iMemHolder {
 public:
  explicit ByteBufferImpl(std::size_t bytes);
  ~ByteBufferImpl() override;
  ByteBufferImpl(const ByteBufferImpl&) = delete;
  ByteBufferImpl& operator=(const ByteBufferImpl&) = delete;

  unsigned char* getBuffer() const noexcept override { return data_; }
  std::size_t getSize() const noexcept override { return size_; }
  std::size_t getUsed() const noexcept override { return used_; }
  void setUsed(std::size_t bytes) noexcept override { used_ = bytes < size_ ? bytes : size_; }

 private:
  unsigned char* data_;
  std::size_t size_;
  std::size_t used_;
};
