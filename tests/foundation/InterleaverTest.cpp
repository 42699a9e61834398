#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "host/Ptr.h"
#include "tonebits/foundation/Aud__Interleaver.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

using Bytes = std::vector<uint8_t>;
using IL = AudioInterleaver;
using Status = IL::eStatus;
using Aud::Simd::eLevel;

// A holder over bytes the test owns, at any offset (so sources can be unaligned).
struct ViewHolder final : iMemHolder {
  ViewHolder(unsigned char* d, std::size_t n) : data(d), size(n), used(n) {}
  unsigned char* getBuffer() const noexcept override { return data; }
  std::size_t getSize() const noexcept override { return size; }
  std::size_t getUsed() const noexcept override { return used; }
  void setUsed(std::size_t bytes) noexcept override { used = bytes; }
  unsigned char* data;
  std::size_t size, used;
};

Kv::Ptr<iMemHolder> view(Bytes& storage, std::size_t offset = 0) {
  return Kv::Ptr<iMemHolder>(new ViewHolder(storage.data() + offset, storage.size() - offset));
}

// Every level this CPU runs, the scalar reference first.
std::vector<eLevel> levels() {
  std::vector<eLevel> all;
  for (int l = Aud::Simd::eScalar; l <= Aud::Simd::supportedLevel(); ++l) all.push_back(eLevel(l));
  return all;
}
struct RestoreLevel {
  eLevel saved = Aud::Simd::activeLevel();
  ~RestoreLevel() { Aud::Simd::setActiveLevel(saved); }
};

Aud::Metadata format(unsigned channels, unsigned stride, unsigned bits, bool bigEndian, int sampleType = 1,
                     Aud::eDataType dataType = Aud::eDataTypePCM) {
  Aud::Metadata m(1, channels, 48000, sampleType);
  m.setStride(stride);
  m.setBitsPerSample(bits);
  m.setEndianType(bigEndian ? Aud::eBigEndian : Aud::eLittleEndian);
  m.setDataType(dataType);
  return m;
}

IL with(const Aud::Metadata& m) {
  IL il;
  il.setAudioFormat(m);
  return il;
}

Bytes randomBytes(std::size_t n, uint32_t seed) {
  std::mt19937 rng(seed);
  Bytes b(n);
  for (auto& x : b) x = uint8_t(rng());
  return b;
}

// What each channel's block must hold, worked out byte by byte from the
// layout: the kept bytes of each slot, reversed for big-endian data, or for
// AES words the 16-bit sample word >> 11 in the first half of the block.
std::vector<Bytes> expectedBlocks(const uint8_t* src, std::size_t groups, unsigned channels, unsigned stride,
                                  unsigned bytes, bool swap, bool aes) {
  std::vector<Bytes> blocks(channels, Bytes(groups * bytes, 0));
  for (std::size_t g = 0; g < groups; ++g) {
    for (unsigned c = 0; c < channels; ++c) {
      const uint8_t* slot = src + (g * channels + c) * stride;
      if (aes) {
        const uint32_t word = slot[0] | slot[1] << 8 | slot[2] << 16 | uint32_t(slot[3]) << 24;
        blocks[c][g * 2] = uint8_t(word >> 11);
        blocks[c][g * 2 + 1] = uint8_t(word >> 19);
      } else {
        for (unsigned b = 0; b < bytes; ++b) blocks[c][g * bytes + b] = slot[swap ? bytes - 1 - b : b];
      }
    }
  }
  return blocks;
}

void expectBlocks(const Aud::StreamBufferList& list, const std::vector<Bytes>& expected, std::size_t groups,
                  unsigned bytes, bool aes = false) {
  ASSERT_EQ(list.buffers.size(), expected.size());
  ASSERT_EQ(list.numSamples, groups);
  for (std::size_t c = 0; c < expected.size(); ++c) {
    const std::size_t compare = aes ? groups * 2 : groups * bytes;
    ASSERT_TRUE(list.buffers[c].valid && list.buffers[c].getBufferSize() >= groups * bytes) << c;
    ASSERT_EQ(0, compare ? std::memcmp(list.buffers[c].getBuffer(), expected[c].data(), compare) : 0) << c;
  }
}

// dst holds written, then untouched 0xAA bytes.
void expectWritten(const uint8_t* dst, std::size_t size, const Bytes& written) {
  for (std::size_t i = 0; i < size; ++i) EXPECT_EQ(dst[i], i < written.size() ? written[i] : 0xAA) << i;
}

TEST(AudioInterleaver, ChannelCountsCopiesAndTheOutputBuffer) {
  for (unsigned n : {0u, 33u, 1u, 32u}) {
    IL il = with(Aud::Metadata(2, 3, 48000, 1));
    const Status want = n == 0 || n == 33 ? IL::eInvalidChannelCount : IL::eOk;
    EXPECT_EQ(il.setNumChannels(n), want) << n;
    EXPECT_EQ(il.getLastError(), want);
    EXPECT_EQ(il.getAudioFormat().getTotalChannels(), want ? 6u : n) << n;
  }
  IL il(2, 4, Aud::eDataTypeAES);
  EXPECT_EQ(il.getAudioFormat().getDataType(), Aud::eDataTypeAES);
  EXPECT_EQ(il.getAudioFormat().getStride(), 3u);
  // Copies take the format and the last status, never the output buffer.
  il.setAudioFormat(Aud::Metadata(1, 2, 48000, 1));
  const Bytes plane(8, 0);
  ASSERT_EQ(il.writeSamplesPlanar({plane.data(), plane.data()}, 4), IL::eOk);
  EXPECT_EQ(il.setNumChannels(0), IL::eInvalidChannelCount);
  IL copy(il), assigned;
  assigned = il;
  for (const IL* other : {&copy, &assigned}) {
    EXPECT_TRUE(other->getLastError() == IL::eInvalidChannelCount &&
                other->getAudioFormat().getChannelsPerStream() == 2);
    EXPECT_TRUE(other->getOutputBuffer() == nullptr && other->getOutputBufferSize() == 0);
  }
  // The output buffer grows and never shrinks.
  IL grow(1, 2, Aud::eDataTypePCM);
  const Bytes big = randomBytes(2000, 3), small = randomBytes(20, 4);
  ASSERT_EQ(grow.writeSamplesPlanar({big.data(), big.data()}, 1000), IL::eOk);
  const unsigned char* buffer = grow.getOutputBuffer();
  ASSERT_EQ(grow.writeSamplesPlanar({small.data(), small.data()}, 10), IL::eOk);
  EXPECT_TRUE(grow.getOutputBuffer() == buffer && grow.getOutputBufferSize() == 4000);
  EXPECT_TRUE(!std::memcmp(buffer, small.data(), 2) && !std::memcmp(buffer + 2, small.data(), 2));

  // An unknown sample type writes nothing, logs, and is no error.
  std::string logged;
  host::setLogSink([&](const char* text) { logged += text; });
  IL unknown = with(format(2, 2, 16, false, 9));
  EXPECT_EQ(unknown.writeSamplesPlanar({small.data(), small.data()}, 4), IL::eOk);
  host::setLogSink({});
  EXPECT_NE(logged.find("WavExport: Mixer buffer sample format not supported!"), std::string::npos);
  EXPECT_EQ(unknown.getOutputBufferSize(), 16u);
}

TEST(AudioInterleaver, RawCopyHelpers) {
  uint8_t dst[12];
  std::memset(dst, 0xAA, sizeof dst);
  uint8_t words[] = {0x45, 0x23, 0x01, 0x00, 0xFF, 0xFF, 0xFF, 0xFF, 0x77};
  EXPECT_EQ(IL().copyAESAudioToBuff(dst, words, 3), 0);
  EXPECT_EQ(IL().copyAESAudioToBuff(dst, words, 9), 4);
  expectWritten(dst, sizeof dst, {0x24, 0x00, 0xFF, 0xFF});  // 0x00012345 >> 11 = 0x24

  // Big-endian slots of 2 to 4 bytes are reversed; other strides write nothing.
  uint8_t src[] = {0x12, 0x34, 0x56, 0x78, 0x9A, 0xBC, 0xDE, 0xF0};
  const struct {
    unsigned stride, count;
    int result;
    Bytes written;
  } rows[] = {{2, 2, 4, {0x34, 0x12, 0x78, 0x56}},
              {3, 2, 6, {0x56, 0x34, 0x12, 0xBC, 0x9A, 0x78}},
              {4, 2, 8, {0x78, 0x56, 0x34, 0x12, 0xF0, 0xDE, 0xBC, 0x9A}},
              {5, 1, 5, {}},
              {0, 3, 0, {}}};
  for (const auto& row : rows) {
    std::memset(dst, 0xAA, sizeof dst);
    EXPECT_EQ(with(format(1, row.stride, 16, true)).copyBigEndianAudioToBuff(dst, src, row.count),
              row.result);
    expectWritten(dst, sizeof dst, row.written);
  }

  // MXF: five words, two channels: groups (w0 w1) (w2 w3); w4 is a partial
  // group. A channel outside the format, no channels or no whole group
  // write nothing.
  uint8_t mxf[20];
  for (int w = 0; w < 5; ++w) {
    const uint32_t word = uint32_t(w + 1) << 11;
    std::memcpy(mxf + 4 * w, &word, 4);
  }
  const struct {
    unsigned channels;
    int srcBytes, channel, result;
    Bytes written;
  } mxfRows[] = {
      {2, 20, 1, 4, {2, 0, 4, 0}}, {2, 20, 0, 4, {1, 0, 3, 0}}, {2, 7, 0, 0, {}},
      {2, -8, 0, 0, {}},           {2, 20, 2, 0, {}},           {2, 20, -1, 0, {}},
      {0, 20, 0, 0, {}},           {5, 20, 4, 2, {5, 0}},       {3, 20, 2, 2, {3, 0}},
  };
  for (const auto& row : mxfRows) {
    std::memset(dst, 0xAA, sizeof dst);
    const IL il = with(format(row.channels, 4, 32, false, 1, Aud::eDataTypeAES));
    EXPECT_EQ(il.deinterleaveMxfAudioToBuff(dst, mxf, row.srcBytes, row.channel), row.result)
        << row.channels << " channels, channel " << row.channel;
    expectWritten(dst, sizeof dst, row.written);
  }
}

TEST(AudioInterleaver, DeinterleaveRefusesWhatWouldReadOutOfBounds) {
  // Channels, stride, bits, big-endian, AES: no channels or 33; stride 0; a
  // big-endian single channel outside 2 to 4 bytes; no bytes per sample, or
  // more than the slot; AES words in slots under 4 bytes, or into 1-byte
  // samples.
  constexpr int kCount = IL::eInvalidChannelCount, kSize = IL::eUnsupportedSampleSize;
  const struct {
    int channels, stride, bits, bigEndian, aes, status;
  } rows[] = {{0, 2, 16, 0, 0, kCount}, {33, 2, 16, 0, 0, kCount}, {1, 0, 16, 0, 0, kSize},
              {2, 0, 16, 0, 0, kSize},  {1, 1, 8, 1, 0, kSize},    {1, 5, 32, 1, 0, kSize},
              {2, 2, 7, 0, 0, kSize},   {2, 2, 24, 0, 0, kSize},   {3, 3, 32, 1, 0, kSize},
              {2, 2, 16, 0, 1, kSize},  {2, 3, 24, 0, 1, kSize},   {2, 4, 8, 0, 1, kSize}};
  for (const auto& row : rows) {
    SCOPED_TRACE(&row - rows);
    Bytes data = randomBytes(64, 1);
    const Bytes before = data;
    const IL il = with(format(row.channels, row.stride, row.bits, row.bigEndian, 1,
                              row.aes ? Aud::eDataTypeAES : Aud::eDataTypePCM));
    Aud::StreamBufferList out;
    out.numSamples = 77;
    out.buffers.resize(3);
    EXPECT_EQ(il.deinterleaveAudio(view(data), out), Status(row.status));
    EXPECT_TRUE(out.numSamples == 77 && out.buffers.size() == 3 && data == before);
    EXPECT_EQ(il.getLastError(), IL::eOk);
  }
  Aud::StreamBufferList out;
  Bytes empty;
  EXPECT_EQ(IL(1, 2, Aud::eDataTypePCM).deinterleaveAudio(Kv::Ptr<iMemHolder>(), out), IL::eNoData);
  EXPECT_EQ(IL(1, 2, Aud::eDataTypePCM).deinterleaveAudio(view(empty), out), IL::eNoData);
}

TEST(AudioInterleaver, SingleChannelSharesTheSource) {
  // Big-endian samples are reversed in place; a trailing partial slot stays.
  for (const auto& [stride, bigEndian] : {std::pair{2u, true}, {3u, true}, {4u, true}, {7u, false}}) {
    Bytes data = randomBytes(2 * stride + 1, stride);
    Bytes want = expectedBlocks(data.data(), 2, 1, stride, stride, bigEndian, false)[0];
    want.push_back(data.back());
    const Kv::Ptr<iMemHolder> src = view(data);
    Aud::StreamBufferList out;
    out.buffers.resize(4);
    ASSERT_EQ(with(format(1, stride, 8 * stride, bigEndian)).deinterleaveAudio(src, out), IL::eOk);
    EXPECT_EQ(data, want) << stride;
    ASSERT_EQ(out.buffers.size(), 1u);
    EXPECT_TRUE(out.buffers[0].buffer == src && out.buffers[0].valid && out.buffers[0].numSamples == 2);
    EXPECT_TRUE(out.numSamples == 2 && out.sampleType == 1);
  }
}

TEST(AudioInterleaver, SlotsKeepTheirSignificantBytes) {
  Aud::StreamBufferList out;
  // Type 0 is 24 bits in 4 bytes too: 3 bytes of each slot are kept, yet a
  // reader going by the type reads 4 per sample, so the block has room for 4.
  Bytes data = randomBytes(2 * 4 * 5, 12);
  ASSERT_EQ(IL(0, 2, Aud::eDataTypePCM).deinterleaveAudio(view(data), out), IL::eOk);
  EXPECT_EQ(out.sampleType, 0);
  expectBlocks(out, expectedBlocks(data.data(), 5, 2, 4, 3, false, false), 5, 3);
  for (const Aud::StreamBuffer& block : out.buffers)
    EXPECT_TRUE(block.buffer->getUsed() == 15 && block.getBufferSize() >= 20);

  // AES words are read where their own slot starts, group after group.
  for (unsigned bits : {16u, 24u, 32u, 64u}) {
    const unsigned stride = bits == 64 ? 8 : 4;
    data = randomBytes(3 * 5 * stride + 2, bits);
    ASSERT_EQ(with(format(3, stride, bits, false, -1, Aud::eDataTypeAES)).deinterleaveAudio(view(data), out),
              IL::eOk);
    expectBlocks(out, expectedBlocks(data.data(), 5, 3, stride, bits / 8, false, true), 5, bits / 8, true);
  }
}

struct SplitCase {
  unsigned channels, stride, bytes;
  bool swap;
};

void checkSplit(const SplitCase& k, std::size_t groups, std::size_t offset, uint32_t seed) {
  const std::size_t groupBytes = std::size_t(k.channels) * k.stride;
  // A trailing partial group is ignored.
  Bytes storage = randomBytes(offset + groups * groupBytes + groupBytes - 1, seed);
  const std::vector<Bytes> expected =
      expectedBlocks(storage.data() + offset, groups, k.channels, k.stride, k.bytes, k.swap, false);
  const int type = k.bytes == 3 && k.stride == 4 ? 5 : 1;
  const IL il = with(format(k.channels, k.stride, 8 * k.bytes + 7, k.swap, type));
  for (eLevel level : levels()) {
    Aud::Simd::setActiveLevel(level);
    SCOPED_TRACE(::testing::Message() << Aud::Simd::levelName(level) << " seed " << seed);
    Bytes copy = storage;  // the source must be left as it was
    Aud::StreamBufferList out;
    ASSERT_EQ(il.deinterleaveAudio(view(copy, offset), out), IL::eOk);
    EXPECT_EQ(copy, storage);
    EXPECT_EQ(out.sampleType, type == 5 ? 2 : 1);
    expectBlocks(out, expected, groups, k.bytes);
  }
}

TEST(AudioInterleaver, SplitsEveryLayoutAtEveryLevel) {
  RestoreLevel restore;
  // Every slot of 1 to 8 bytes keeping 1 to all of its bytes, either byte
  // order. Up to 8 channels the lengths reach past one pass of every fast
  // kernel; above, where one loop serves every count, a few groups do.
  uint32_t seed = 0;
  for (unsigned channels = 2; channels <= 32; ++channels)
    for (unsigned stride = 1; stride <= 8; ++stride)
      for (unsigned bytes = 1; bytes <= stride; ++bytes)
        for (bool swap : {false, true})
          for (std::size_t groups : {1, 3, 37})
            if (channels <= 8 || groups == 3) checkSplit({channels, stride, bytes, swap}, groups, 0, ++seed);

  // The fast layouts at lengths around the widths their kernels work in (8,
  // 16 and 32 groups a pass), on sources at odd addresses.
  const SplitCase layouts[] = {{0, 1, 1, false}, {0, 2, 2, false}, {0, 2, 2, true},
                               {0, 3, 3, false}, {0, 3, 3, true},  {0, 4, 3, false},
                               {0, 4, 3, true},  {0, 4, 4, false}, {0, 4, 4, true}};
  for (SplitCase k : layouts)
    for (k.channels = 2; k.channels <= 8; ++k.channels)
      for (std::size_t groups : {0, 1, 3, 7, 8, 9, 15, 16, 17, 31, 32, 33, 63, 64, 65, 97, 161})
        for (std::size_t offset : {0, 3}) checkSplit(k, groups, offset, ++seed);
}

TEST(AudioInterleaver, ReusesOnlyBlocksWithRoomForTheResult) {
  // A list with as many blocks as channels, of this length, is written in
  // place only when every block's memory can take the samples and is not the
  // source itself (a reader may still hold the blocks). Else fresh blocks.
  Bytes data = randomBytes(2 * 2 * 16, 11);
  const std::vector<Bytes> expected = expectedBlocks(data.data(), 16, 2, 2, 2, false, false);
  const IL il(1, 2, Aud::eDataTypePCM);
  const struct {
    std::vector<std::size_t> bytes;  // memory of each block; 0 for none
    uint32_t samples;
    bool aliasSource, reused;
  } rows[] = {{{}, 16, false, false},      {{32, 32, 32}, 16, false, false}, {{32, 32}, 15, false, false},
              {{0, 0}, 16, false, false},  {{32, 31}, 16, false, false},     {{1, 32}, 16, false, false},
              {{32, 32}, 16, true, false}, {{32, 40}, 16, false, true}};
  for (const auto& row : rows) {
    SCOPED_TRACE(&row - rows);
    Aud::StreamBufferList out;
    out.numSamples = row.samples;
    out.sampleType = 1;
    for (std::size_t bytes : row.bytes) {
      Aud::StreamBuffer block(0, row.samples, 1);
      if (bytes) block.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(bytes));
      if (row.aliasSource) block.buffer = view(data);
      block.valid = true;
      out.buffers.push_back(block);
    }
    const Aud::StreamBufferList callers = out;
    ASSERT_EQ(il.deinterleaveAudio(view(data), out), IL::eOk);
    for (std::size_t c = 0; c < 2 && c < callers.buffers.size(); ++c)
      EXPECT_EQ(out.buffers[c].buffer == callers.buffers[c].buffer, row.reused) << c;
    expectBlocks(out, expected, 16, 2);
  }
}

// Plane bytes for a sample type, salted with the values conversions get
// wrong: NaN, infinities, -0.0, denormals, the clamp bounds.
Bytes planeBytes(int type, std::size_t samples, uint32_t seed) {
  Bytes b = randomBytes(samples * Aud::bytesPerSampleOfType(type), seed);
  constexpr float fInf = std::numeric_limits<float>::infinity();
  constexpr double dInf = std::numeric_limits<double>::infinity();
  const float floats[] = {NAN, fInf, -fInf, -0.0f, 1e-40f, 1.0f, -1.0f, 1.5f, 0.5f};
  const double doubles[] = {double(NAN), -dInf, 1e-310, -0.0, 1.0, 1e300, 0.1};
  std::mt19937 rng(seed);
  for (std::size_t s = 0; s < samples; ++s) {
    if (rng() % 3) continue;
    if (type == 0 || type == 7) std::memcpy(&b[s * 4], &floats[rng() % std::size(floats)], 4);
    if (type == 8) std::memcpy(&b[s * 8], &doubles[rng() % std::size(doubles)], 8);
  }
  return b;
}

TEST(AudioInterleaver, ExportFastPathsMatchTheReference) {
  RestoreLevel restore;
  uint32_t seed = 5000;
  for (int type = 0; type < Aud::kNumSampleTypes; ++type) {
    for (unsigned channels : {1u, 2u, 3u, 6u, 8u, 9u, 32u}) {
      for (unsigned samples : {1u, 31u, 33u, 129u, 600u}) {
        std::vector<Bytes> planes;
        std::vector<const unsigned char*> pointers;
        for (unsigned c = 0; c < channels; ++c) planes.push_back(planeBytes(type, samples, ++seed));
        for (const Bytes& p : planes) pointers.push_back(p.data());
        const std::size_t need = std::size_t(samples) * channels * Aud::bytesPerSampleOfType(type);
        Bytes reference;
        for (eLevel level : levels()) {
          SCOPED_TRACE(::testing::Message() << Aud::Simd::levelName(level) << " seed " << seed);
          Aud::Simd::setActiveLevel(level);
          IL il(type, channels, Aud::eDataTypePCM);
          ASSERT_EQ(il.writeSamplesPlanar(pointers, samples), IL::eOk);
          ASSERT_GE(il.getOutputBufferSize(), need);
          if (level == Aud::Simd::eScalar)
            reference.assign(il.getOutputBuffer(), il.getOutputBuffer() + need);
          ASSERT_EQ(0, std::memcmp(il.getOutputBuffer(), reference.data(), need));
        }
      }
    }
  }
}

template <class T>
Bytes asBytes(std::initializer_list<T> values) {
  Bytes b(values.size() * sizeof(T));
  std::memcpy(b.data(), values.begin(), b.size());
  return b;
}

TEST(AudioInterleaver, ExportPassesSamplesThroughTheirRules) {
  const uint32_t nanBits = 0x7FC01234;
  float nanWithPayload;
  std::memcpy(&nanWithPayload, &nanBits, 4);
  const struct {
    int type;
    Bytes left, right, interleaved;
  } rows[] = {
      {1, asBytes<int16_t>({32767, 5}), asBytes<int16_t>({-32768, -1}),
       asBytes<int16_t>({32767, -32768, 5, -1})},
      {4, {255, 128}, {0, 1}, {254, 0, 127, 0}},
      {3, {0x7F, 0x80}, {0, 0xFF}, {0x7F, 0, 0x80, 0xFF}},
      {5, asBytes<uint32_t>({0x00FFFFFF, 0x7F000001}), asBytes<uint32_t>({0x12800000, 0}),
       asBytes<uint32_t>({0xFFFFFFFF, 0xFF800000, 0x00000001, 0})},
      {0, asBytes<float>({1.0f, -2.0f}), asBytes<float>({0.25f, -1.0f}),
       asBytes<float>({0.99999988079071044921875f, 0.25f, -1.0f, -1.0f})},
      {7, asBytes<float>({1.5f, nanWithPayload}), asBytes<float>({-7.0f, 0.0f}),
       asBytes<float>({1.5f, -7.0f, nanWithPayload, 0.0f})},
      {8, asBytes<double>({0.1, 1e300}), asBytes<double>({-0.5, 1e-300}),
       asBytes<double>({double(0.1f), -0.5, std::numeric_limits<double>::infinity(), 0.0})},
      {6, asBytes<int32_t>({2147483647, -2147483647 - 1}), asBytes<int32_t>({0, -1}),
       asBytes<int32_t>({2147483647, 0, -2147483647 - 1, 0})},
  };
  RestoreLevel restore;
  for (const auto& row : rows) {
    for (eLevel level : levels()) {
      Aud::Simd::setActiveLevel(level);
      IL il(row.type, 2, Aud::eDataTypePCM);
      ASSERT_EQ(il.writeSamplesPlanar({row.left.data(), row.right.data()}, 2), IL::eOk);
      const Bytes got(il.getOutputBuffer(), il.getOutputBuffer() + row.interleaved.size());
      EXPECT_EQ(got, row.interleaved) << "type " << row.type << " at " << Aud::Simd::levelName(level);
    }
  }
}

TEST(AudioInterleaver, ExportRefusalsAreRecorded) {
  const Bytes plane(64, 0);
  // Type, streams, channels, stride, samples, planes (the last one null?):
  // too few or too many planes; no samples or a null plane; a slot narrower
  // or wider than the type; exactly 4 GiB of output (8 bytes x 2^29 samples
  // wraps to 0 in 32 bits), and far beyond.
  constexpr int kMismatch = IL::eChannelCountMismatch, kNoData = IL::eNoData,
                kSize = IL::eUnsupportedSampleSize, kTooLarge = IL::eOutputTooLarge;
  const struct {
    long long type, streams, channels, stride, samples, planes, nullPlane, status;
  } rows[] = {{1, 1, 2, 2, 4, 1, 0, kMismatch},       {1, 2, 1, 2, 4, 3, 0, kMismatch},
              {1, 1, 2, 2, 0, 2, 0, kNoData},         {1, 1, 2, 2, 4, 2, 1, kNoData},
              {5, 1, 2, 3, 4, 2, 0, kSize},           {1, 1, 2, 4, 4, 2, 0, kSize},
              {8, 1, 1, 8, 1 << 29, 1, 0, kTooLarge}, {6, 2, 16, 4, 0xFFFFFFFF, 32, 0, kTooLarge}};
  for (const auto& row : rows) {
    SCOPED_TRACE(&row - rows);
    std::vector<const unsigned char*> planes(row.planes, plane.data());
    if (row.nullPlane) planes.back() = nullptr;
    Aud::Metadata m(unsigned(row.streams), unsigned(row.channels), 48000, int(row.type));
    m.setStride(unsigned(row.stride));
    IL il = with(m);
    EXPECT_EQ(il.writeSamplesPlanar(planes, unsigned(row.samples)), Status(row.status));
    EXPECT_EQ(il.getLastError(), Status(row.status));
    EXPECT_EQ(il.getOutputBuffer(), nullptr);
  }
}

}  // namespace
