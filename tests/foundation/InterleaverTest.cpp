#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
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
using Status = AudioInterleaver::eStatus;

// A holder over bytes the test owns, at any offset (so sources can be
// unaligned) and with any used size.
class ViewHolder final : public iMemHolder {
 public:
  ViewHolder(unsigned char* data, std::size_t size) : data_(data), size_(size), used_(size) {}
  unsigned char* getBuffer() const noexcept override { return data_; }
  std::size_t getSize() const noexcept override { return size_; }
  std::size_t getUsed() const noexcept override { return used_; }
  void setUsed(std::size_t bytes) noexcept override { used_ = bytes; }

 private:
  unsigned char* data_;
  std::size_t size_, used_;
};

Kv::Ptr<iMemHolder> view(Bytes& storage, std::size_t offset, std::size_t bytes) {
  return Kv::Ptr<iMemHolder>(new ViewHolder(storage.data() + offset, bytes));
}

// Every level this CPU runs, the scalar reference first; restores the
// active level when done.
class Levels {
 public:
  Levels() : saved_(Aud::Simd::activeLevel()) {}
  ~Levels() { Aud::Simd::setActiveLevel(saved_); }
  static std::vector<Aud::Simd::eLevel> all() {
    std::vector<Aud::Simd::eLevel> levels;
    for (int l = Aud::Simd::eScalar; l <= Aud::Simd::supportedLevel(); ++l)
      levels.push_back(static_cast<Aud::Simd::eLevel>(l));
    return levels;
  }

 private:
  Aud::Simd::eLevel saved_;
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
                  unsigned bytes, bool aes) {
  ASSERT_EQ(list.buffers.size(), expected.size());
  ASSERT_EQ(list.numSamples, groups);
  for (std::size_t c = 0; c < expected.size(); ++c) {
    const Aud::StreamBuffer& block = list.buffers[c];
    ASSERT_TRUE(block.valid);
    ASSERT_GE(block.getBufferSize(), groups * bytes);
    const std::size_t compare = aes ? groups * 2 : groups * bytes;
    if (compare) {
      ASSERT_EQ(0, std::memcmp(block.getBuffer(), expected[c].data(), compare)) << "channel " << c;
    }
  }
}

// ---- state ----

TEST(AudioInterleaver, ChannelCountsAcceptedAndRefused) {
  struct Row {
    unsigned n;
    Status status;
    unsigned channelsAfter;
  };
  const Row rows[] = {{0, AudioInterleaver::eInvalidChannelCount, 6},
                      {33, AudioInterleaver::eInvalidChannelCount, 6},
                      {1000, AudioInterleaver::eInvalidChannelCount, 6},
                      {1, AudioInterleaver::eOk, 1},
                      {32, AudioInterleaver::eOk, 32}};
  for (const Row& row : rows) {
    AudioInterleaver il(1, 3, Aud::eDataTypePCM);
    Aud::Metadata m = il.getAudioFormat();
    m.setAudioStreams(2);
    il.setAudioFormat(m);
    EXPECT_EQ(il.setNumChannels(row.n), row.status) << row.n;
    EXPECT_EQ(il.getLastError(), row.status);
    EXPECT_EQ(il.getAudioFormat().getTotalChannels(), row.channelsAfter) << row.n;
  }
}

TEST(AudioInterleaver, ConstructionAndCopyKeepOwnOutput) {
  AudioInterleaver il(2, 4, Aud::eDataTypeAES);
  EXPECT_EQ(il.getAudioFormat().getDataType(), Aud::eDataTypeAES);
  EXPECT_EQ(il.getAudioFormat().getSamplesPerSec(), 48000u);
  EXPECT_EQ(il.getAudioFormat().getStride(), 3u);
  EXPECT_EQ(il.getOutputBuffer(), nullptr);

  il.setAudioFormat(Aud::Metadata(1, 2, 48000, 1));
  const Bytes plane(8, 0);
  ASSERT_EQ(il.writeSamplesPlanar({plane.data(), plane.data()}, 4), AudioInterleaver::eOk);
  EXPECT_EQ(il.setNumChannels(0), AudioInterleaver::eInvalidChannelCount);
  AudioInterleaver copy(il);
  AudioInterleaver assigned;
  assigned = il;
  for (const AudioInterleaver* other : {&copy, &assigned}) {
    EXPECT_EQ(other->getLastError(), AudioInterleaver::eInvalidChannelCount);
    EXPECT_EQ(other->getAudioFormat().getChannelsPerStream(), 2u);
    EXPECT_EQ(other->getOutputBuffer(), nullptr);
    EXPECT_EQ(other->getOutputBufferSize(), 0u);
  }
}

// ---- raw copy helpers ----

TEST(AudioInterleaver, AESWordsBecomeBits11To26) {
  AudioInterleaver il;
  const uint8_t src[] = {0x45, 0x23, 0x01, 0x00, 0xFF, 0xFF, 0xFF, 0xFF, 0x77};
  uint8_t dst[8];
  std::memset(dst, 0xAA, sizeof dst);
  EXPECT_EQ(il.copyAESAudioToBuff(dst, const_cast<uint8_t*>(src), 3), 0);
  EXPECT_EQ(dst[0], 0xAA);
  EXPECT_EQ(il.copyAESAudioToBuff(dst, const_cast<uint8_t*>(src), 9), 4);
  const uint8_t expected[] = {0x24, 0x00, 0xFF, 0xFF, 0xAA};  // 0x00012345 >> 11 = 0x24
  EXPECT_EQ(0, std::memcmp(dst, expected, sizeof expected));
}

TEST(AudioInterleaver, BigEndianCopyReversesEachSlot) {
  const uint8_t src[] = {0x12, 0x34, 0x56, 0x78, 0x9A, 0xBC, 0xDE, 0xF0};
  struct Row {
    unsigned stride, count;
    int result;
    Bytes written;  // then untouched 0xAA
  };
  const Row rows[] = {
      {2, 2, 4, {0x34, 0x12, 0x78, 0x56}},
      {3, 2, 6, {0x56, 0x34, 0x12, 0xBC, 0x9A, 0x78}},
      {4, 2, 8, {0x78, 0x56, 0x34, 0x12, 0xF0, 0xDE, 0xBC, 0x9A}},
      {5, 1, 5, {}},
      {1, 3, 3, {}},
      {0, 3, 0, {}},
  };
  for (const Row& row : rows) {
    AudioInterleaver il(1, 1, Aud::eDataTypePCM);
    Aud::Metadata m = il.getAudioFormat();
    m.setStride(row.stride);
    il.setAudioFormat(m);
    uint8_t dst[12];
    std::memset(dst, 0xAA, sizeof dst);
    EXPECT_EQ(il.copyBigEndianAudioToBuff(dst, const_cast<uint8_t*>(src), row.count), row.result)
        << row.stride;
    for (std::size_t i = 0; i < sizeof dst; ++i)
      EXPECT_EQ(dst[i], i < row.written.size() ? row.written[i] : 0xAA) << row.stride << " byte " << i;
  }
}

TEST(AudioInterleaver, MxfChannelWordsAndRefusals) {
  // Five words, two channels: groups (w0 w1) (w2 w3); w4 is a partial group.
  uint8_t src[20];
  for (int w = 0; w < 5; ++w) {
    const uint32_t word = uint32_t(w + 1) << 11;
    std::memcpy(src + 4 * w, &word, 4);
  }
  struct Row {
    unsigned channels;
    int srcBytes, channel, result;
    Bytes written;
  };
  const Row rows[] = {
      {2, 20, 1, 4, {2, 0, 4, 0}}, {2, 20, 0, 4, {1, 0, 3, 0}}, {2, 7, 0, 0, {}},
      {2, -8, 0, 0, {}},           {2, 20, 2, 0, {}},           {2, 20, -1, 0, {}},
      {0, 20, 0, 0, {}},           {5, 20, 4, 2, {5, 0}},       {3, 20, 2, 2, {3, 0}},
  };
  for (const Row& row : rows) {
    AudioInterleaver il(1, 1, Aud::eDataTypeAES);
    Aud::Metadata m = il.getAudioFormat();
    m.setChannelsPerStream(row.channels);
    il.setAudioFormat(m);
    uint8_t dst[8];
    std::memset(dst, 0xAA, sizeof dst);
    SCOPED_TRACE(::testing::Message() << row.channels << " channels, channel " << row.channel);
    EXPECT_EQ(il.deinterleaveMxfAudioToBuff(dst, src, row.srcBytes, row.channel), row.result);
    for (std::size_t i = 0; i < sizeof dst; ++i)
      EXPECT_EQ(dst[i], i < row.written.size() ? row.written[i] : 0xAA) << "byte " << i;
  }
}

// ---- inbound ----

TEST(AudioInterleaver, DeinterleaveRefusesWhatWouldReadOutOfBounds) {
  struct Row {
    const char* what;
    unsigned channels, stride, bits;
    bool bigEndian;
    Aud::eDataType dataType;
    Status status;
  };
  const Row rows[] = {
      {"no channels", 0, 2, 16, false, Aud::eDataTypePCM, AudioInterleaver::eInvalidChannelCount},
      {"33 channels", 33, 2, 16, false, Aud::eDataTypePCM, AudioInterleaver::eInvalidChannelCount},
      {"stride 0, one channel", 1, 0, 16, false, Aud::eDataTypePCM, AudioInterleaver::eUnsupportedSampleSize},
      {"stride 0, two channels", 2, 0, 16, false, Aud::eDataTypePCM,
       AudioInterleaver::eUnsupportedSampleSize},
      {"big-endian stride 1", 1, 1, 8, true, Aud::eDataTypePCM, AudioInterleaver::eUnsupportedSampleSize},
      {"big-endian stride 5", 1, 5, 32, true, Aud::eDataTypePCM, AudioInterleaver::eUnsupportedSampleSize},
      {"no bytes per sample", 2, 2, 7, false, Aud::eDataTypePCM, AudioInterleaver::eUnsupportedSampleSize},
      {"sample wider than slot", 2, 2, 24, false, Aud::eDataTypePCM,
       AudioInterleaver::eUnsupportedSampleSize},
      {"big-endian wider than slot", 3, 3, 32, true, Aud::eDataTypePCM,
       AudioInterleaver::eUnsupportedSampleSize},
      {"AES in 2-byte slots", 2, 2, 16, false, Aud::eDataTypeAES, AudioInterleaver::eUnsupportedSampleSize},
      {"AES in 3-byte slots", 2, 3, 24, false, Aud::eDataTypeAES, AudioInterleaver::eUnsupportedSampleSize},
      {"AES into 1-byte samples", 2, 4, 8, false, Aud::eDataTypeAES,
       AudioInterleaver::eUnsupportedSampleSize},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    Bytes data = randomBytes(64, 1);
    const Bytes before = data;
    AudioInterleaver il;
    il.setAudioFormat(format(row.channels, row.stride, row.bits, row.bigEndian, 1, row.dataType));
    Aud::StreamBufferList out;
    out.numSamples = 77;
    out.buffers.resize(3);
    EXPECT_EQ(il.deinterleaveAudio(view(data, 0, data.size()), out), row.status);
    EXPECT_EQ(out.numSamples, 77u);
    EXPECT_EQ(out.buffers.size(), 3u);
    EXPECT_EQ(data, before);
    EXPECT_EQ(il.getLastError(), AudioInterleaver::eOk);
  }
  AudioInterleaver il(1, 2, Aud::eDataTypePCM);
  Aud::StreamBufferList out;
  EXPECT_EQ(il.deinterleaveAudio(Kv::Ptr<iMemHolder>(), out), AudioInterleaver::eNoData);
  Bytes empty;
  EXPECT_EQ(il.deinterleaveAudio(view(empty, 0, 0), out), AudioInterleaver::eNoData);
}

TEST(AudioInterleaver, SingleChannelSharesTheSource) {
  struct Row {
    unsigned stride;
    bool bigEndian;
    Bytes before, after;
    uint32_t samples;
  };
  const Row rows[] = {
      {2, true, {0x12, 0x34, 0x56}, {0x34, 0x12, 0x56}, 1},
      {3, true, {1, 2, 3, 4, 5, 6, 7}, {3, 2, 1, 6, 5, 4, 7}, 2},
      {4, true, {1, 2, 3, 4, 5, 6, 7, 8}, {4, 3, 2, 1, 8, 7, 6, 5}, 2},
      {2, false, {0x12, 0x34}, {0x12, 0x34}, 1},
      {7, false, {1, 2, 3, 4, 5, 6, 7, 8}, {1, 2, 3, 4, 5, 6, 7, 8}, 1},
  };
  for (const Row& row : rows) {
    Bytes data = row.before;
    AudioInterleaver il;
    il.setAudioFormat(format(1, row.stride, 8 * row.stride, row.bigEndian, 1));
    const Kv::Ptr<iMemHolder> src = view(data, 0, data.size());
    Aud::StreamBufferList out;
    out.buffers.resize(4);
    ASSERT_EQ(il.deinterleaveAudio(src, out), AudioInterleaver::eOk);
    EXPECT_EQ(data, row.after) << row.stride;
    ASSERT_EQ(out.buffers.size(), 1u);
    EXPECT_TRUE(out.buffers[0].buffer == src);
    EXPECT_TRUE(out.buffers[0].valid);
    EXPECT_EQ(out.buffers[0].numSamples, row.samples);
    EXPECT_EQ(out.numSamples, row.samples);
    EXPECT_EQ(out.sampleType, 1);
  }
}

TEST(AudioInterleaver, StereoTwentyFourInFourArrivesPacked) {
  Bytes data = {0x01, 0x02, 0x03, 0xF1, 0x11, 0x12, 0x13, 0xF2,
                0x21, 0x22, 0x23, 0xF3, 0x31, 0x32, 0x33, 0xF4};
  AudioInterleaver il(5, 2, Aud::eDataTypePCM);
  Aud::StreamBufferList out;
  ASSERT_EQ(il.deinterleaveAudio(view(data, 0, data.size()), out), AudioInterleaver::eOk);
  EXPECT_EQ(out.sampleType, 2);
  EXPECT_EQ(out.buffers[0].sampleType, 2);
  expectBlocks(out, {{0x01, 0x02, 0x03, 0x21, 0x22, 0x23}, {0x11, 0x12, 0x13, 0x31, 0x32, 0x33}}, 2, 3,
               false);
  EXPECT_EQ(out.buffers[1].buffer->getUsed(), 6u);
}

TEST(AudioInterleaver, BlocksHaveRoomForTheirTypeWhateverTheBitsSay) {
  // Type 0 is described as 24 bits in 4 bytes: 3 bytes of each slot are
  // kept, yet a reader going by the type reads 4 per sample.
  Bytes data = randomBytes(2 * 4 * 5, 12);
  AudioInterleaver il(0, 2, Aud::eDataTypePCM);
  Aud::StreamBufferList out;
  ASSERT_EQ(il.deinterleaveAudio(view(data, 0, data.size()), out), AudioInterleaver::eOk);
  EXPECT_EQ(out.sampleType, 0);
  expectBlocks(out, expectedBlocks(data.data(), 5, 2, 4, 3, false, false), 5, 3, false);
  for (const Aud::StreamBuffer& block : out.buffers) {
    EXPECT_EQ(block.buffer->getUsed(), 15u);
    EXPECT_GE(block.getBufferSize(), 20u);
  }
}

TEST(AudioInterleaver, AESWordsAreReadFromTheirOwnSlots) {
  // 24 significant bits in 4-byte slots: each word must be read where its
  // slot starts, group after group, and land in the first half of a block
  // that holds 3 bytes per sample.
  for (unsigned bits : {16u, 24u, 32u, 64u}) {
    const unsigned stride = bits == 64 ? 8 : 4;
    Bytes data = randomBytes(3 * 5 * stride + 2, bits);
    AudioInterleaver il;
    il.setAudioFormat(format(3, stride, bits, false, -1, Aud::eDataTypeAES));
    Aud::StreamBufferList out;
    ASSERT_EQ(il.deinterleaveAudio(view(data, 0, data.size()), out), AudioInterleaver::eOk);
    expectBlocks(out, expectedBlocks(data.data(), 5, 3, stride, bits / 8, false, true), 5, bits / 8, true);
  }
}

struct SplitCase {
  unsigned channels, stride, bytes;
  bool swap;
};

void checkSplit(const SplitCase& k, std::size_t groups, std::size_t offset, uint32_t seed) {
  const std::size_t groupBytes = std::size_t(k.channels) * k.stride;
  const std::size_t extra = groupBytes - 1;  // a partial group is ignored
  Bytes storage = randomBytes(offset + groups * groupBytes + extra, seed);
  const std::vector<Bytes> expected =
      expectedBlocks(storage.data() + offset, groups, k.channels, k.stride, k.bytes, k.swap, false);
  const int type = k.bytes == 3 && k.stride == 4 ? 5 : 1;
  AudioInterleaver il;
  il.setAudioFormat(format(k.channels, k.stride, 8 * k.bytes + 7, k.swap, type));
  for (Aud::Simd::eLevel level : Levels::all()) {
    Aud::Simd::setActiveLevel(level);
    SCOPED_TRACE(::testing::Message()
                 << Aud::Simd::levelName(level) << ", " << k.channels << " channels, stride " << k.stride
                 << ", " << k.bytes << " bytes, swap " << k.swap << ", " << groups << " groups, offset "
                 << offset);
    Bytes copy = storage;  // the source must be left as it was
    Aud::StreamBufferList out;
    ASSERT_EQ(il.deinterleaveAudio(view(copy, offset, copy.size() - offset), out), AudioInterleaver::eOk);
    EXPECT_EQ(copy, storage);
    EXPECT_EQ(out.sampleType, type == 5 ? 2 : 1);
    expectBlocks(out, expected, groups, k.bytes, false);
  }
}

TEST(AudioInterleaver, SplitsEveryLayoutAndChannelCountAtEveryLevel) {
  // Every slot of 1 to 8 bytes keeping 1 to all of its bytes, either byte
  // order. Up to 8 channels the lengths reach past one pass of every fast
  // kernel; above, where one loop serves every count, a few groups do.
  Levels restore;
  uint32_t seed = 0;
  for (unsigned channels = 2; channels <= 32; ++channels)
    for (unsigned stride = 1; stride <= 8; ++stride)
      for (unsigned bytes = 1; bytes <= stride; ++bytes)
        for (bool swap : {false, true})
          for (std::size_t groups : {1, 3, 37}) {
            if (channels > 8 && groups != 3) continue;
            checkSplit({channels, stride, bytes, swap}, groups, 0, ++seed);
          }
}

TEST(AudioInterleaver, FastLayoutsAtEveryLengthAndAlignment) {
  // Lengths around the widths the fast kernels work in (8, 16 and 32
  // groups a pass), on sources at odd addresses.
  const SplitCase layouts[] = {{0, 1, 1, false}, {0, 2, 2, false}, {0, 2, 2, true},
                               {0, 3, 3, false}, {0, 3, 3, true},  {0, 4, 3, false},
                               {0, 4, 3, true},  {0, 4, 4, false}, {0, 4, 4, true}};
  const std::size_t lengths[] = {0,  1,  2,  3,  7,  8,  9,  15, 16, 17, 31,
                                 32, 33, 47, 63, 64, 65, 95, 96, 97, 161};
  Levels restore;
  uint32_t seed = 1000;
  for (SplitCase k : layouts)
    for (unsigned channels = 2; channels <= 8; ++channels)
      for (std::size_t groups : lengths)
        for (std::size_t offset : {0, 3}) {
          k.channels = channels;
          checkSplit(k, groups, offset, ++seed);
        }
}

TEST(AudioInterleaver, SteadyStreamReusesTheCallersBlocks) {
  Bytes data = randomBytes(2 * 3 * 10, 7);
  AudioInterleaver il(2, 2, Aud::eDataTypePCM);
  Aud::StreamBufferList out;
  ASSERT_EQ(il.deinterleaveAudio(view(data, 0, data.size()), out), AudioInterleaver::eOk);
  const unsigned char* first[2] = {out.buffers[0].getBuffer(), out.buffers[1].getBuffer()};
  const Aud::StreamBuffer held = out.buffers[1];  // a reader still holding the block

  Bytes next = randomBytes(2 * 3 * 10, 8);
  ASSERT_EQ(il.deinterleaveAudio(view(next, 0, next.size()), out), AudioInterleaver::eOk);
  EXPECT_EQ(out.buffers[0].getBuffer(), first[0]);
  EXPECT_EQ(out.buffers[1].getBuffer(), first[1]);
  expectBlocks(out, expectedBlocks(next.data(), 10, 2, 3, 3, false, false), 10, 3, false);

  // Another length: fresh blocks; the held one keeps what it had.
  Bytes shorter = randomBytes(2 * 3 * 4, 9);
  ASSERT_EQ(il.deinterleaveAudio(view(shorter, 0, shorter.size()), out), AudioInterleaver::eOk);
  EXPECT_NE(out.buffers[1].getBuffer(), first[1]);
  EXPECT_EQ(
      0, std::memcmp(held.getBuffer(), expectedBlocks(next.data(), 10, 2, 3, 3, false, false)[1].data(), 30));
}

TEST(AudioInterleaver, ReusesOnlyBlocksWithRoomForTheResult) {
  // Lists whose count and length match but whose memory cannot take the
  // samples (or is the source itself) get fresh blocks instead.
  Bytes data = randomBytes(2 * 2 * 16, 11);
  const std::vector<Bytes> expected = expectedBlocks(data.data(), 16, 2, 2, 2, false, false);
  AudioInterleaver il(1, 2, Aud::eDataTypePCM);
  struct Row {
    const char* what;
    std::size_t bytes[2];  // memory of each block; 0 for none
    bool aliasSource;
  };
  const Row rows[] = {{"no memory", {0, 0}, false},
                      {"second too small", {32, 31}, false},
                      {"first too small", {1, 32}, false},
                      {"the source's own memory", {32, 32}, true}};
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    Aud::StreamBufferList out;
    out.numSamples = 16;
    for (std::size_t bytes : row.bytes) {
      Aud::StreamBuffer block(0, 16, 1);
      if (bytes) block.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(bytes));
      if (row.aliasSource) block.buffer = view(data, 0, data.size());
      out.buffers.push_back(block);
    }
    const Aud::StreamBufferList callers = out;
    ASSERT_EQ(il.deinterleaveAudio(view(data, 0, data.size()), out), AudioInterleaver::eOk);
    for (int c = 0; c < 2; ++c) EXPECT_FALSE(out.buffers[c].buffer == callers.buffers[c].buffer);
    expectBlocks(out, expected, 16, 2, false);
  }
  // Room enough, and more: written in place.
  Aud::StreamBufferList out;
  out.numSamples = 16;
  out.sampleType = 1;
  for (int c = 0; c < 2; ++c) {
    Aud::StreamBuffer block(0, 16, 1);
    block.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(32 + 8 * c));
    block.valid = true;
    out.buffers.push_back(block);
  }
  const Aud::StreamBufferList callers = out;
  ASSERT_EQ(il.deinterleaveAudio(view(data, 0, data.size()), out), AudioInterleaver::eOk);
  for (int c = 0; c < 2; ++c) EXPECT_TRUE(out.buffers[c].buffer == callers.buffers[c].buffer);
  expectBlocks(out, expected, 16, 2, false);
}

// ---- outbound ----

// Plane bytes for a sample type, salted with the values conversions get
// wrong: NaN, infinities, -0.0, denormals, the clamp bounds.
Bytes planeBytes(int type, std::size_t samples, uint32_t seed) {
  Bytes b = randomBytes(samples * Aud::bytesPerSampleOfType(type), seed);
  const float floats[] = {std::numeric_limits<float>::quiet_NaN(),
                          std::numeric_limits<float>::infinity(),
                          -std::numeric_limits<float>::infinity(),
                          -0.0f,
                          1e-40f,
                          1.0f,
                          -1.0f,
                          1.5f,
                          0.5f};
  const double doubles[] = {std::numeric_limits<double>::quiet_NaN(),
                            -std::numeric_limits<double>::infinity(),
                            1e-310,
                            -0.0,
                            1.0,
                            1e300,
                            0.1};
  std::mt19937 rng(seed);
  for (std::size_t s = 0; s < samples; ++s) {
    if (rng() % 3) continue;
    if (type == 0 || type == 7) std::memcpy(&b[s * 4], &floats[rng() % std::size(floats)], 4);
    if (type == 8) std::memcpy(&b[s * 8], &doubles[rng() % std::size(doubles)], 8);
  }
  return b;
}

TEST(AudioInterleaver, ExportFastPathsMatchTheReference) {
  Levels restore;
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
        for (Aud::Simd::eLevel level : Levels::all()) {
          SCOPED_TRACE(::testing::Message() << Aud::Simd::levelName(level) << ", type " << type << ", "
                                            << channels << " channels, " << samples << " samples");
          Aud::Simd::setActiveLevel(level);
          AudioInterleaver il(type, channels, Aud::eDataTypePCM);
          ASSERT_EQ(il.writeSamplesPlanar(pointers, samples), AudioInterleaver::eOk);
          ASSERT_GE(il.getOutputBufferSize(), need);
          const Bytes got(il.getOutputBuffer(), il.getOutputBuffer() + need);
          if (level == Aud::Simd::eScalar) {
            reference = got;
          } else {
            ASSERT_EQ(0, std::memcmp(got.data(), reference.data(), need));
          }
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
  const float nanWithPayload = [] {
    const uint32_t bits = 0x7FC01234;
    float f;
    std::memcpy(&f, &bits, 4);
    return f;
  }();
  struct Row {
    int type;
    Bytes left, right, interleaved;
  };
  const Row rows[] = {
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
  Levels restore;
  for (const Row& row : rows) {
    for (Aud::Simd::eLevel level : Levels::all()) {
      Aud::Simd::setActiveLevel(level);
      AudioInterleaver il(row.type, 2, Aud::eDataTypePCM);
      ASSERT_EQ(il.writeSamplesPlanar({row.left.data(), row.right.data()}, 2), AudioInterleaver::eOk);
      const Bytes got(il.getOutputBuffer(), il.getOutputBuffer() + row.interleaved.size());
      EXPECT_EQ(got, row.interleaved) << "type " << row.type << " at " << Aud::Simd::levelName(level);
    }
  }
}

TEST(AudioInterleaver, IntegerSamplesComeBackFromFloatUnchanged) {
  // The fast export joins 8-, 16- and packed 24-bit planes without the
  // float round trip; that holds only while the rules give every value
  // back. All 8- and 16-bit values; 24-bit near the ends and every 251st.
  struct Row {
    int type;
    int32_t step;
  };
  for (const Row row : {Row{3, 1}, Row{1, 1}, Row{2, 251}}) {
    const unsigned size = Aud::bytesPerSampleOfType(row.type);
    const int32_t top = (1 << (8 * size - 1)) - 1;
    for (int32_t v = -top - 1; v <= top; v += (v > -top + 300 && v < top - 300) ? row.step : 1) {
      unsigned char in[4], out[4] = {};
      std::memcpy(in, &v, 4);
      ASSERT_TRUE(Aud::sampleFromFloat(row.type, Aud::sampleToFloat(row.type, in), out));
      ASSERT_EQ(0, std::memcmp(in, out, size)) << "type " << row.type << " value " << v;
    }
  }
}

TEST(AudioInterleaver, ExportRefusalsAreRecorded) {
  const Bytes plane(64, 0);
  const unsigned char* p = plane.data();
  struct Row {
    const char* what;
    int type;
    unsigned streams, channels, stride, samples;
    std::vector<const unsigned char*> planes;
    Status status;
  };
  const Row rows[] = {
      {"too few planes", 1, 1, 2, 2, 4, {p}, AudioInterleaver::eChannelCountMismatch},
      {"too many planes", 1, 2, 1, 2, 4, {p, p, p}, AudioInterleaver::eChannelCountMismatch},
      {"no samples", 1, 1, 2, 2, 0, {p, p}, AudioInterleaver::eNoData},
      {"a null plane", 1, 1, 2, 2, 4, {p, nullptr}, AudioInterleaver::eNoData},
      {"slot narrower than the type", 5, 1, 2, 3, 4, {p, p}, AudioInterleaver::eUnsupportedSampleSize},
      {"slot wider than the type", 1, 1, 2, 4, 4, {p, p}, AudioInterleaver::eUnsupportedSampleSize},
      // 4 GiB exactly: 8 bytes x 1 channel x 2^29 samples wraps to 0 in 32 bits.
      {"4 GiB of output", 8, 1, 1, 8, 1u << 29, {p}, AudioInterleaver::eOutputTooLarge},
      {"far beyond 4 GiB", 6, 2, 16, 4, 0xFFFFFFFFu, std::vector<const unsigned char*>(32, p),
       AudioInterleaver::eOutputTooLarge},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    AudioInterleaver il(row.type, row.channels, Aud::eDataTypePCM);
    Aud::Metadata m = il.getAudioFormat();
    m.setAudioStreams(row.streams);
    m.setStride(row.stride);
    il.setAudioFormat(m);
    EXPECT_EQ(il.writeSamplesPlanar(row.planes, row.samples), row.status);
    EXPECT_EQ(il.getLastError(), row.status);
    EXPECT_EQ(il.getOutputBuffer(), nullptr);
  }
}

TEST(AudioInterleaver, UnknownSampleTypeIsLoggedAndWritesNothing) {
  std::string logged;
  host::setLogSink([&](const char* text) { logged += text; });
  AudioInterleaver il(9, 2, Aud::eDataTypePCM);
  Aud::Metadata m = il.getAudioFormat();
  m.setStride(2);
  il.setAudioFormat(m);
  const Bytes plane(8, 0x55);
  EXPECT_EQ(il.writeSamplesPlanar({plane.data(), plane.data()}, 4), AudioInterleaver::eOk);
  host::setLogSink({});
  EXPECT_NE(logged.find("WavExport: Mixer buffer sample format not supported!"), std::string::npos);
  EXPECT_EQ(il.getOutputBufferSize(), 16u);
}

TEST(AudioInterleaver, OutputBufferGrowsAndNeverShrinks) {
  AudioInterleaver il(1, 2, Aud::eDataTypePCM);
  const Bytes big = randomBytes(2000, 3), small = randomBytes(20, 4);
  ASSERT_EQ(il.writeSamplesPlanar({big.data(), big.data()}, 1000), AudioInterleaver::eOk);
  const unsigned char* buffer = il.getOutputBuffer();
  EXPECT_EQ(il.getOutputBufferSize(), 4000u);
  ASSERT_EQ(il.writeSamplesPlanar({small.data(), small.data()}, 10), AudioInterleaver::eOk);
  EXPECT_EQ(il.getOutputBuffer(), buffer);
  EXPECT_EQ(il.getOutputBufferSize(), 4000u);
  EXPECT_EQ(0, std::memcmp(buffer, small.data(), 2));
  EXPECT_EQ(0, std::memcmp(buffer + 2, small.data(), 2));
}

}  // namespace
