// Sample blocks: Aud::StreamBuffer is one channel's block of samples held
// through a shared host memory handle; Aud::StreamBufferList is one block
// per channel, all of one length and sample type.
//
// Copying a block or a list shares the memory (one reference per block) and
// never touches the samples. Readers of a list take the length and sample
// type from the list's own fields, not from its blocks.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "host/OS.h"
#include "host/Ptr.h"
#include "tonebits/export.h"

namespace Aud {

struct TONEBITS_API StreamBuffer {
  uint32_t tag = 0;  // the creator's; the library writes 0 and never reads it
  Kv::Ptr<iMemHolder> buffer;
  bool valid = false;
  uint32_t numSamples = 0;
  int32_t sampleType = -1;

  StreamBuffer() noexcept = default;
  StreamBuffer(unsigned int tag, unsigned int numSamples, int sampleType) noexcept;
  StreamBuffer(const StreamBuffer& other) noexcept = default;
  StreamBuffer& operator=(const StreamBuffer& other) noexcept = default;
  ~StreamBuffer() = default;

  // The address of the first sample, or null when no memory is attached.
  unsigned char* getBuffer() const noexcept { return buffer ? buffer->getBuffer() : nullptr; }
  // Bytes of attached memory (0 without memory).
  std::size_t getBufferSize() const noexcept { return buffer ? buffer->getSize() : 0; }
};

struct TONEBITS_API StreamBufferList {
  std::vector<StreamBuffer, StdAllocator<StreamBuffer>> buffers;
  uint32_t numSamples = 0;
  int32_t sampleType = -1;

  StreamBufferList() = default;
  StreamBufferList(const StreamBufferList& other) = default;
  StreamBufferList& operator=(const StreamBufferList& other) = default;
  ~StreamBufferList() = default;
};

}  // namespace Aud
