// The operating-system services object: the allocator every heap block of
// the library comes from, and the 32-bit atomic counters that reference
// counts and reader ids are kept in.
//
// Contract: alloc returns null when memory runs out (callers that cannot
// cope throw std::bad_alloc); release accepts null. atomicIncrement and
// atomicDecrement return the new value and are sequentially consistent.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <new>

#include "host/HostExport.h"

class HOST_API iAllocator {
 public:
  virtual ~iAllocator();
  virtual void* alloc(std::size_t bytes) noexcept = 0;
  virtual void release(void* block) noexcept = 0;
};

class HOST_API iAtomics {
 public:
  virtual ~iAtomics();
  virtual int32_t atomicIncrement(std::atomic<int32_t>& counter) noexcept = 0;
  virtual int32_t atomicDecrement(std::atomic<int32_t>& counter) noexcept = 0;
};

class HOST_API iOS {
 public:
  virtual ~iOS();
  virtual iAllocator* allocator() noexcept = 0;
  virtual iAtomics* atomics() noexcept = 0;
};

HOST_API iOS* OS() noexcept;

namespace host {

// Allocates through OS() and throws std::bad_alloc on failure.
HOST_API void* allocateOrThrow(std::size_t bytes);

// Base for classes whose instances must live on the host heap: class-level
// operator new and delete are thin calls to the host allocator.
class HOST_API HostAllocated {
 public:
  static void* operator new(std::size_t bytes);
  static void operator delete(void* block) noexcept;
};

}  // namespace host

// The standard-allocator adapter over the host allocator, for containers and
// strings whose storage must come from the host heap.
template <class T>
class StdAllocator {
 public:
  using value_type = T;
  StdAllocator() noexcept = default;
  template <class U>
  StdAllocator(const StdAllocator<U>&) noexcept {}
  T* allocate(std::size_t n) {
    if (n > std::size_t(-1) / sizeof(T)) throw std::bad_alloc();
    return static_cast<T*>(host::allocateOrThrow(n * sizeof(T)));
  }
  void deallocate(T* p, std::size_t) noexcept { OS()->allocator()->release(p); }
  template <class U>
  bool operator==(const StdAllocator<U>&) const noexcept {
    return true;
  }
};
