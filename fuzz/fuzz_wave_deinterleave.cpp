// Arbitrary bytes as a WAVE format header and the audio that follows it:
// the header is read into a format, the audio split into channel blocks
// (twice, so the second call takes the reuse path) and, when the format has
// a sample type, joined back through the export path.
//
// Input: 18 header bytes, one control byte (bits 0-1: streams - 1, bit 2:
// big-endian, bit 3: AES coding), one byte choosing the instruction-set
// level, then the audio. Every fast path must agree with the scalar
// reference byte for byte; allocations stay within a small multiple of the
// input.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "host/Ptr.h"
#include "tonebits/foundation/Aud__Interleaver.h"
#include "tonebits/foundation/Aud__Metadata.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

constexpr std::size_t kPrefix = sizeof(WavHeaderEx) + 2;
constexpr unsigned kMaxExportChannels = 64;

void check(bool ok) {
  if (!ok) std::abort();
}

Kv::Ptr<iMemHolder> holderOf(const uint8_t* audio, std::size_t bytes) {
  Kv::Ptr<iMemHolder> holder(new ByteBufferImpl(bytes));
  if (bytes) std::memcpy(holder->getBuffer(), audio, bytes);
  return holder;
}

// Reads every byte the list says it holds, so that the sanitizer sees any
// block shorter than its samples.
uint32_t touch(const Aud::StreamBufferList& list, std::size_t bytesPerSample) {
  uint32_t sum = 0;
  for (const Aud::StreamBuffer& block : list.buffers) {
    const std::size_t bytes = std::size_t(list.numSamples) * bytesPerSample;
    check(block.getBufferSize() >= bytes);
    for (std::size_t i = 0; i < bytes; ++i) sum += block.getBuffer()[i];
  }
  return sum;
}

bool sameBlocks(const Aud::StreamBufferList& a, const Aud::StreamBufferList& b, std::size_t bytes) {
  if (a.buffers.size() != b.buffers.size() || a.numSamples != b.numSamples || a.sampleType != b.sampleType)
    return false;
  for (std::size_t c = 0; c < a.buffers.size(); ++c)
    if (bytes && std::memcmp(a.buffers[c].getBuffer(), b.buffers[c].getBuffer(), bytes) != 0) return false;
  return true;
}

void splitAudio(const AudioInterleaver& il, Aud::Simd::eLevel level, const uint8_t* audio,
                std::size_t bytes) {
  const Aud::Metadata& format = il.getAudioFormat();
  Aud::Simd::setActiveLevel(level);
  Aud::StreamBufferList out;
  const Kv::Ptr<iMemHolder> src = holderOf(audio, bytes);
  const AudioInterleaver::eStatus status = il.deinterleaveAudio(src, out);
  if (status != AudioInterleaver::eOk) {
    check(out.buffers.empty());
    return;
  }
  const unsigned channels = format.getChannelsPerStream();
  check(out.buffers.size() == channels);
  const std::size_t perSample = channels == 1 ? format.getStride() : format.getBytesPerSample();
  touch(out, perSample);

  // The steady-stream path writes into the same blocks.
  if (channels > 1) {
    const Kv::Ptr<iMemHolder> again = holderOf(audio, bytes);
    const unsigned char* first = out.buffers[0].getBuffer();
    check(il.deinterleaveAudio(again, out) == AudioInterleaver::eOk);
    check(out.buffers[0].getBuffer() == first);
  }

  // The scalar reference on a fresh copy gives the same bytes.
  Aud::Simd::setActiveLevel(Aud::Simd::eScalar);
  Aud::StreamBufferList reference;
  check(il.deinterleaveAudio(holderOf(audio, bytes), reference) == AudioInterleaver::eOk);
  const bool aes = channels > 1 && format.getEndianType() == Aud::eLittleEndian &&
                   format.getDataType() == Aud::eDataTypeAES;
  const std::size_t compare = std::size_t(out.numSamples) * (aes ? 2 : perSample);
  check(sameBlocks(out, reference, compare));
}

void joinAudio(const AudioInterleaver& il, Aud::Simd::eLevel level, const uint8_t* audio, std::size_t bytes) {
  const Aud::Metadata& m = il.getAudioFormat();
  const unsigned size = Aud::bytesPerSampleOfType(m.getSampleTypeNumber());
  const uint64_t channels = uint64_t(m.getAudioStreams()) * m.getChannelsPerStream();
  if (size == 0 || channels == 0 || channels > kMaxExportChannels) return;
  const std::size_t samples = bytes / (channels * size);
  std::vector<const unsigned char*> planes;
  for (unsigned c = 0; c < channels; ++c) planes.push_back(audio + c * samples * size);

  AudioInterleaver fast(il), scalar(il);
  Aud::Simd::setActiveLevel(level);
  const AudioInterleaver::eStatus status = fast.writeSamplesPlanar(planes, unsigned(samples));
  Aud::Simd::setActiveLevel(Aud::Simd::eScalar);
  check(scalar.writeSamplesPlanar(planes, unsigned(samples)) == status);
  if (status != AudioInterleaver::eOk) return;
  const std::size_t need = std::size_t(m.getStride()) * channels * samples;
  check(fast.getOutputBufferSize() >= need);
  check(std::memcmp(fast.getOutputBuffer(), scalar.getOutputBuffer(), need) == 0);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, std::size_t size) {
  if (size < kPrefix) return 0;
  WavHeaderEx header;
  std::memcpy(&header, data, sizeof header);
  const uint8_t control = data[sizeof header];
  const auto level =
      static_cast<Aud::Simd::eLevel>(data[sizeof header + 1] % (Aud::Simd::supportedLevel() + 1));
  const uint8_t* audio = data + kPrefix;
  const std::size_t bytes = size - kPrefix;

  Aud::Metadata format;
  format.getFromWAVFORMATEX(header, 1 + (control & 3));
  if (control & 4) format.setEndianType(Aud::eBigEndian);
  if (control & 8) format.setDataType(Aud::eDataTypeAES);

  AudioInterleaver il;
  il.setAudioFormat(format);
  splitAudio(il, level, audio, bytes);
  joinAudio(il, level, audio, bytes);
  return 0;
}
