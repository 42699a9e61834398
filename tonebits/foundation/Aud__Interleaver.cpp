#include "tonebits/foundation/Aud__Interleaver.h"

#include <algorithm>
#include <climits>
#include <cstring>
#include <new>

#include "host/Log.h"
#include "host/OS.h"
#include "host/Vector.h"
#include "tonebits/foundation/Aud__InterleaverKernels.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

using Aud::Interleave::joinReference;
using Aud::Interleave::splitAESReference;
using Aud::Interleave::splitReference;

int saturateToInt(uint64_t v) noexcept { return v > uint64_t(INT_MAX) ? INT_MAX : int(v); }

bool overlaps(const unsigned char* a, std::size_t aBytes, const unsigned char* b,
              std::size_t bBytes) noexcept {
  if (aBytes == 0 || bBytes == 0) return false;
  const auto x = reinterpret_cast<uintptr_t>(a), y = reinterpret_cast<uintptr_t>(b);
  return x < y + bBytes && y < x + aBytes;
}

// The caller's blocks are written in place only when each has memory for
// the whole result and none shares the source's bytes.
bool canReuse(const Aud::StreamBufferList& out, unsigned channels, uint32_t numSamples,
              std::size_t blockBytes, const unsigned char* src, std::size_t srcBytes) noexcept {
  if (out.buffers.size() != channels || out.buffers[0].numSamples != numSamples) return false;
  for (const Aud::StreamBuffer& block : out.buffers) {
    if (blockBytes == 0) continue;
    const unsigned char* memory = block.getBuffer();
    if (!memory || block.getBufferSize() < blockBytes || overlaps(memory, blockBytes, src, srcBytes))
      return false;
  }
  return true;
}

// Blocks of capacity bytes each, of which used count as the samples.
Aud::StreamBufferList freshBlocks(unsigned channels, uint32_t numSamples, int sampleType,
                                  std::size_t capacity, std::size_t used) {
  Aud::StreamBufferList list;
  list.buffers.reserve(channels);
  for (unsigned c = 0; c < channels; ++c) {
    Aud::StreamBuffer block(0, numSamples, sampleType);
    block.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(capacity));
    block.buffer->setUsed(used);
    block.valid = true;
    list.buffers.push_back(block);
  }
  list.numSamples = numSamples;
  list.sampleType = sampleType;
  return list;
}

// Hands the blocks of list to out (no copy of the blocks' references).
void replaceList(Aud::StreamBufferList& out, Aud::StreamBufferList& list) noexcept {
  out.buffers.swap(list.buffers);
  out.numSamples = list.numSamples;
  out.sampleType = list.sampleType;
}

void split(const unsigned char* src, unsigned char* const* dst, std::size_t groups, unsigned channels,
           unsigned stride, unsigned bytes, bool swap) noexcept {
  const Aud::Simd::eLevel level = Aud::Simd::activeLevel();
  if (auto fn = Aud::Interleave::findSplit(level, channels, stride, bytes, swap)) return fn(src, dst, groups);
  if (auto fn = Aud::Interleave::findSplitAnyChannels(level, stride, bytes, swap))
    return fn(src, dst, groups, channels);
  splitReference(src, dst, groups, channels, stride, bytes, swap);
}

// ---- export ----

// Each sample through its type's rules, one at a time.
void exportReference(const unsigned char* const* planes, unsigned char* out, std::size_t numSamples,
                     unsigned channels, int sampleType) noexcept {
  const unsigned size = Aud::bytesPerSampleOfType(sampleType);
  for (std::size_t s = 0; s < numSamples; ++s) {
    for (unsigned c = 0; c < channels; ++c) {
      const unsigned char* in = planes[c] + s * size;
      unsigned char* o = out + (s * channels + c) * size;
      if (sampleType == 7) {
        std::memcpy(o, in, 4);  // the bits as they stand, NaN payloads included
      } else {
        Aud::sampleFromFloat(sampleType, Aud::sampleToFloat(sampleType, in), o);
      }
    }
  }
}

// Types whose samples come back from float exactly as they went in, so that
// joining is all the export does: every 8-, 16- and packed 24-bit value is
// a multiple of its type's step inside the clamp bounds, which float holds
// exactly and scales back exactly; type 7's rule is a copy of the bits.
constexpr bool roundTripIsExact(int sampleType) noexcept {
  return sampleType == 1 || sampleType == 2 || sampleType == 3 || sampleType == 7;
}

// A chunk at a time: the planes joined into the output, then the joined
// samples put through the block conversions in place (each sample's rule
// does not depend on where it lies), while the chunk is still in cache.
void exportFast(const unsigned char* const* planes, unsigned char* out, std::size_t numSamples,
                unsigned channels, int sampleType) {
  const unsigned size = Aud::bytesPerSampleOfType(sampleType);
  const Aud::Simd::eLevel level = Aud::Simd::activeLevel();
  const Aud::Interleave::JoinFn join = Aud::Interleave::findJoin(level, channels, size);
  const Aud::Interleave::JoinAnyFn joinAny = Aud::Interleave::findJoinAnyChannels(level, size);
  constexpr std::size_t kFloats = 256;
  alignas(32) float floats[kFloats];
  const std::size_t chunk = std::max<std::size_t>(1, kFloats / channels);  // groups
  Vector<const unsigned char*> from(planes, planes + channels);
  for (std::size_t done = 0; done < numSamples; done += chunk) {
    const std::size_t groups = std::min(chunk, numSamples - done);
    unsigned char* joined = out + done * channels * size;
    if (channels == 1) {
      std::memcpy(joined, from[0], groups * size);
    } else if (join) {
      join(from.data(), joined, groups);
    } else if (joinAny) {
      joinAny(from.data(), joined, groups, channels);
    } else {
      joinReference(from.data(), joined, groups, channels, size);
    }
    for (const unsigned char*& plane : from) plane += groups * size;
    if (roundTripIsExact(sampleType)) continue;
    const std::size_t samples = groups * channels;
    for (std::size_t s = 0; s < samples; s += kFloats) {
      const std::size_t n = std::min(kFloats, samples - s);
      Aud::convertToFloat(sampleType, joined + s * size, floats, n);
      Aud::convertFromFloat(sampleType, floats, joined + s * size, n);
    }
  }
}

}  // namespace

AudioInterleaver::AudioInterleaver(int sampleType, unsigned int numChannels, Aud::eDataType dataType) noexcept
    : format(1, numChannels, 48000, sampleType) {
  format.setDataType(dataType);
}

AudioInterleaver::AudioInterleaver(const AudioInterleaver& other) noexcept
    : format(other.format), lastError(other.lastError) {}

AudioInterleaver& AudioInterleaver::operator=(const AudioInterleaver& other) noexcept {
  format = other.format;
  lastError = other.lastError;
  return *this;
}

AudioInterleaver::~AudioInterleaver() { OS()->allocator()->release(outputBuffer); }

AudioInterleaver::eStatus AudioInterleaver::setNumChannels(unsigned int n) noexcept {
  if (n == 0 || n > kMaxChannels) return sle(eInvalidChannelCount);
  format.setChannelsPerStream(n);
  format.setAudioStreams(1);
  return sle(eOk);
}

// ---- raw copy helpers ----

int AudioInterleaver::copyAESAudioToBuff(unsigned char* dst, unsigned char* src,
                                         unsigned int srcBytes) const noexcept {
  const std::size_t words = srcBytes / 4;
  if (words == 0 || !dst || !src) return 0;
  unsigned char* const out[1] = {dst};
  splitAESReference(src, out, words, 1, 4);
  return int(2 * words);
}

int AudioInterleaver::copyBigEndianAudioToBuff(unsigned char* dst, unsigned char* src,
                                               unsigned int count) const noexcept {
  // count is in samples for every stride.
  const unsigned stride = format.getStride();
  if ((stride == 2 || stride == 3 || stride == 4) && dst && src) {
    unsigned char* const out[1] = {dst};
    splitReference(src, out, count, 1, stride, stride, true);
  }
  return saturateToInt(uint64_t(count) * stride);
}

int AudioInterleaver::deinterleaveMxfAudioToBuff(unsigned char* dst, unsigned char* src, int srcBytes,
                                                 int channel) const noexcept {
  const unsigned channels = format.getChannelsPerStream();
  if (channels == 0 || channel < 0 || unsigned(channel) >= channels || srcBytes <= 0 || !dst || !src)
    return 0;
  const uint64_t groupBytes = uint64_t(channels) * 4;
  const uint64_t groups = uint64_t(srcBytes) / groupBytes;
  if (groups < 1) return 0;
  unsigned char* const out[1] = {dst};
  // One "channel" whose slot is the whole group, starting at the wanted word.
  splitAESReference(src + std::size_t(channel) * 4, out, groups, 1, unsigned(groupBytes));
  return int(2 * groups);
}

// ---- inbound ----

AudioInterleaver::eStatus AudioInterleaver::deinterleaveAudio(const Kv::Ptr<iMemHolder>& src,
                                                              Aud::StreamBufferList& out) const {
  if (!src || !src->getBuffer()) return eNoData;
  const bool swap = format.getEndianType() != Aud::eLittleEndian;
  const unsigned bytes = format.getBytesPerSample();
  const unsigned channels = format.getChannelsPerStream();
  if (channels == 0 || channels > kMaxChannels) return eInvalidChannelCount;
  const unsigned stride = format.getStride();
  if (stride == 0) return eUnsupportedSampleSize;

  unsigned char* data = src->getBuffer();
  const std::size_t used = src->getUsed();
  const uint64_t groupBytes = uint64_t(stride) * channels;
  // A block counts its samples in 32 bits; anything beyond is left alone.
  const uint32_t numSamples = uint32_t(std::min<uint64_t>(used / groupBytes, UINT32_MAX));

  if (channels == 1) {
    if (swap) {
      if (stride < 2 || stride > 4) return eUnsupportedSampleSize;
      // In place: each slot reversed whole.
      for (std::size_t s = 0; s < numSamples; ++s) std::reverse(data + s * stride, data + (s + 1) * stride);
    }
    const int type = format.getSampleTypeNumber();
    Aud::StreamBufferList single;
    Aud::StreamBuffer block(0, numSamples, type);
    block.buffer = src;
    block.valid = true;
    single.buffers.push_back(block);
    single.numSamples = numSamples;
    single.sampleType = type;
    replaceList(out, single);
    return eOk;
  }

  // Every read must stay inside its own slot, and an AES word needs four
  // bytes to read and two to write.
  const bool aes = !swap && format.getDataType() == Aud::eDataTypeAES;
  if (bytes == 0 || bytes > stride || (aes && (stride < 4 || bytes < 2))) return eUnsupportedSampleSize;

  const int type = format.getSampleTypeNumber() == 5 ? 2 : format.getSampleTypeNumber();
  const std::size_t blockBytes = std::size_t(numSamples) * bytes;
  if (!canReuse(out, channels, numSamples, blockBytes, data, used)) {
    // A description whose significant bytes are fewer than its sample
    // type's (a float type described as 24 bits in 4 bytes) gets blocks
    // with room for the type's samples all the same, so that a reader going
    // by the list's type stays inside them.
    const std::size_t capacity = std::size_t(numSamples) * std::max(bytes, Aud::bytesPerSampleOfType(type));
    Aud::StreamBufferList fresh = freshBlocks(channels, numSamples, type, capacity, blockBytes);
    replaceList(out, fresh);
  }
  if (numSamples == 0) return eOk;

  unsigned char* dst[kMaxChannels];
  for (unsigned c = 0; c < channels; ++c) dst[c] = out.buffers[c].getBuffer();
  if (aes) {
    splitAESReference(data, dst, numSamples, channels, stride);
  } else {
    split(data, dst, numSamples, channels, stride, bytes, swap);
  }
  return eOk;
}

// ---- outbound ----

AudioInterleaver::eStatus AudioInterleaver::writeSamplesPlanar(
    const std::vector<unsigned char const*>& planes, unsigned int numSamples) {
  const uint64_t channels = uint64_t(format.getAudioStreams()) * format.getChannelsPerStream();
  if (planes.size() != channels) return sle(eChannelCountMismatch);
  if (numSamples == 0) return sle(eNoData);
  for (const unsigned char* plane : planes)
    if (!plane) return sle(eNoData);
  const int type = format.getSampleTypeNumber();
  const unsigned size = Aud::bytesPerSampleOfType(type);
  const unsigned stride = format.getStride();
  // The output is laid out in slots of the sample type's size.
  if (size != 0 && stride != size) return sle(eUnsupportedSampleSize);
  const uint64_t need = uint64_t(stride) * channels * numSamples;
  if (need > UINT32_MAX) return sle(eOutputTooLarge);

  if (outputBufferSize < need) {
    void* grown = OS()->allocator()->alloc(std::size_t(need));
    if (!grown) throw std::bad_alloc();
    OS()->allocator()->release(outputBuffer);
    outputBuffer = static_cast<unsigned char*>(grown);
    outputBufferSize = uint32_t(need);
  }

  if (size == 0) {
    LogBoth("WavExport: Mixer buffer sample format not supported!");
    return sle(eOk);
  }
  if (Aud::Simd::activeLevel() == Aud::Simd::eScalar) {
    exportReference(planes.data(), outputBuffer, numSamples, unsigned(channels), type);
  } else {
    exportFast(planes.data(), outputBuffer, numSamples, unsigned(channels), type);
  }
  return sle(eOk);
}
