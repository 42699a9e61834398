#include "host/Ptr.h"

#include <cstring>

iObject::~iObject() = default;

ByteBufferImpl::ByteBufferImpl(std::size_t bytes)
    : data_(static_cast<unsigned char*>(host::allocateOrThrow(bytes))), size_(bytes), used_(bytes) {
  std::memset(data_, 0, bytes);
}

ByteBufferImpl::~ByteBufferImpl() { OS()->allocator()->release(data_); }
