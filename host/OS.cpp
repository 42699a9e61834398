#include "host/OS.h"

#include <cstdlib>

iAllocator::~iAllocator() = default;
iAtomics::~iAtomics() = default;
iOS::~iOS() = default;

namespace {

class HeapAllocator final : public iAllocator {
 public:
  void* alloc(std::size_t bytes) noexcept override { return std::malloc(bytes ? bytes : 1); }
  void release(void* block) noexcept override { std::free(block); }
};

class SeqCstAtomics final : public iAtomics {
 public:
  int32_t atomicIncrement(std::atomic<int32_t>& counter) noexcept override { return ++counter; }
  int32_t atomicDecrement(std::atomic<int32_t>& counter) noexcept override { return --counter; }
};

class DefaultOS final : public iOS {
 public:
  iAllocator* allocator() noexcept override { return &allocator_; }
  iAtomics* atomics() noexcept override { return &atomics_; }

 private:
  HeapAllocator allocator_;
  SeqCstAtomics atomics_;
};

}  // namespace

iOS* OS() noexcept {
  // Never destroyed: holders released during static destruction still need it.
  static DefaultOS* const os = new (std::malloc(sizeof(DefaultOS))) DefaultOS();
  return os;
}

namespace host {

void* allocateOrThrow(std::size_t bytes) {
  void* block = OS()->allocator()->alloc(bytes);
  if (!block) throw std::bad_alloc();
  return block;
}

void* HostAllocated::operator new(std::size_t bytes) { return allocateOrThrow(bytes); }
void HostAllocated::operator delete(void* block) noexcept { OS()->allocator()->release(block); }

}  // namespace host
