// AudioInterleaver converts between the interleaved audio that devices and
// files exchange and the one-block-per-channel lists the library works in.
//
// Inbound, deinterleaveAudio splits a memory block laid out as the format
// (an Aud::Metadata) says into an Aud::StreamBufferList: big-endian samples
// are byte-reversed, AES words are unpacked to 16-bit samples, and every
// other sample keeps its significant bytes (so 24-bit samples in 4-byte
// slots arrive packed, as type 2). One channel is handed on without a copy.
//
// Outbound, writeSamplesPlanar interleaves one plane per channel into the
// interleaver's own output buffer, passing each sample through the
// conversion rules of its sample type (so values are clamped, and types 4
// and 6 may change).
//
// The raw helpers copy AES words to 16-bit samples, reverse big-endian
// samples, and take one channel out of an MXF AES element.
//
// At most 32 channels are accepted. The hot loops have a plain reference
// and fast paths chosen by Aud::Simd::activeLevel(), with identical bytes.
// An interleaver is used by one thread at a time.
#pragma once

#include <cstdint>
#include <vector>

#include "host/Ptr.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__Metadata.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"

class TONEBITS_API AudioInterleaver {
 public:
  enum eStatus : int32_t {
    eOk = 0,
    eInvalidChannelCount = 3,     // channel count 0 or above 32
    eUnsupportedSampleSize = 11,  // a slot or sample size the operation cannot handle
    eChannelCountMismatch = 12,   // plane count is not the format's total channel count
    eNoData = 13,                 // no source memory, or nothing to write
    eOutputTooLarge = 14,         // the interleaved result would exceed 4 GiB - 1 bytes
  };

  static constexpr unsigned int kMaxChannels = 32;

  // A zeroed format.
  AudioInterleaver() noexcept = default;
  // One stream of numChannels channels of sampleType at 48 kHz, coded as
  // dataType.
  AudioInterleaver(int sampleType, unsigned int numChannels, Aud::eDataType dataType) noexcept;
  // Copies take the format and the last status; each interleaver keeps its
  // own output buffer.
  AudioInterleaver(const AudioInterleaver& other) noexcept;
  AudioInterleaver& operator=(const AudioInterleaver& other) noexcept;
  ~AudioInterleaver();

  void setAudioFormat(const Aud::Metadata& newFormat) noexcept { format = newFormat; }
  const Aud::Metadata& getAudioFormat() const noexcept { return format; }
  // One stream of n channels, n from 1 to 32; otherwise eInvalidChannelCount
  // and the format is left alone. Recorded.
  eStatus setNumChannels(unsigned int n) noexcept;
  eStatus getLastError() const noexcept { return lastError; }

  // ---- raw copy helpers; each returns the bytes written ----

  // srcBytes / 4 little-endian words, each written as the 16-bit sample made
  // of its bits 11 to 26.
  int copyAESAudioToBuff(unsigned char* dst, unsigned char* src, unsigned int srcBytes) const noexcept;
  // count samples of the format's stride (2, 3 or 4) with their bytes
  // reversed; any other stride writes nothing. Returns count x stride either
  // way (saturated to the int range).
  int copyBigEndianAudioToBuff(unsigned char* dst, unsigned char* src, unsigned int count) const noexcept;
  // The given channel's word of each whole group of channelsPerStream 32-bit
  // words, as the AES helper writes it. A channel outside the format, a
  // format without channels or less than one group writes nothing: 0.
  int deinterleaveMxfAudioToBuff(unsigned char* dst, unsigned char* src, int srcBytes,
                                 int channel) const noexcept;

  // ---- inbound ----

  // Splits the used bytes of src into out, one block per channelsPerStream.
  // A single channel shares src's memory (big-endian samples are reversed in
  // place). Several channels are copied into out's own blocks when it has
  // exactly that many, of this length, each with memory for the samples
  // and none on src's own bytes (the list's fields are then left as they
  // are); otherwise into fresh blocks. Not recorded in getLastError().
  //   eNoData                 src is null or has no memory
  //   eInvalidChannelCount    channelsPerStream is 0 or above 32
  //   eUnsupportedSampleSize  stride 0; a big-endian single channel whose
  //                           stride is not 2, 3 or 4; several channels with
  //                           bytes per sample 0 or above the stride, or AES
  //                           words (little-endian coding 210) in slots under
  //                           4 bytes or unpacked into samples under 2 bytes
  // out is untouched on failure.
  eStatus deinterleaveAudio(const Kv::Ptr<iMemHolder>& src, Aud::StreamBufferList& out) const;

  // ---- outbound ----

  // Interleaves planes (one per channel of the format, numSamples samples
  // each in the format's sample type) into the output buffer. Recorded.
  //   eChannelCountMismatch   planes.size() is not the total channel count
  //   eNoData                 numSamples is 0, or a plane is null
  //   eUnsupportedSampleSize  the stride is not the size of the sample type
  //   eOutputTooLarge         the result would exceed 4 GiB - 1 bytes
  // A sample type outside 0 to 8 writes nothing, logs, and is eOk.
  // Throws std::bad_alloc when the output buffer cannot grow.
  eStatus writeSamplesPlanar(const std::vector<unsigned char const*>& planes, unsigned int numSamples);

  // The interleaved result of the last successful export: its first
  // stride x channels x numSamples bytes. Null before the first.
  const unsigned char* getOutputBuffer() const noexcept { return outputBuffer; }
  // Bytes allocated at getOutputBuffer(); it grows, never shrinks.
  unsigned int getOutputBufferSize() const noexcept { return outputBufferSize; }

 protected:
  eStatus sle(eStatus status) noexcept { return lastError = status; }
  // Bytes of one group of samples (one per channel of a stream).
  unsigned int bytesPerGroup() const noexcept { return format.getStride() * format.getChannelsPerStream(); }

  Aud::Metadata format;
  unsigned char* outputBuffer = nullptr;
  uint32_t outputBufferSize = 0;
  eStatus lastError = eOk;
};
