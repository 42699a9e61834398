#include <gtest/gtest.h>

#include "tonebits/foundation/Aud__StreamBuffer.h"

namespace {

Aud::StreamBuffer blockWith(unsigned samples, int type, unsigned char fill) {
  Aud::StreamBuffer b(0, samples, type);
  b.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(samples * 2));
  for (unsigned i = 0; i < samples * 2; ++i) b.getBuffer()[i] = fill;
  b.valid = true;
  return b;
}

TEST(StreamBuffer, DefaultsAndSizedConstruction) {
  Aud::StreamBuffer b;
  EXPECT_EQ(b.tag, 0u);
  EXPECT_FALSE(b.buffer);
  EXPECT_FALSE(b.valid);
  EXPECT_EQ(b.numSamples, 0u);
  EXPECT_EQ(b.sampleType, -1);
  EXPECT_EQ(b.getBuffer(), nullptr);  // no memory: null, never a dereference
  EXPECT_EQ(b.getBufferSize(), 0u);

  Aud::StreamBuffer sized(5, 100, 1);
  EXPECT_EQ(sized.tag, 5u);
  EXPECT_EQ(sized.numSamples, 100u);
  EXPECT_EQ(sized.sampleType, 1);
  EXPECT_FALSE(sized.valid);
  EXPECT_EQ(sized.getBuffer(), nullptr);
}

TEST(StreamBuffer, CopiesShareMemoryThatOutlivesTheOriginal) {
  Aud::StreamBuffer copy;
  {
    Aud::StreamBuffer original = blockWith(8, 1, 0x5A);
    copy = original;
    EXPECT_EQ(copy.getBuffer(), original.getBuffer());
    EXPECT_EQ(original.buffer.useCount(), 2);
    Aud::StreamBuffer constructed(original);
    EXPECT_EQ(original.buffer.useCount(), 3);
  }
  ASSERT_NE(copy.getBuffer(), nullptr);
  EXPECT_EQ(copy.buffer.useCount(), 1);
  EXPECT_EQ(copy.getBuffer()[15], 0x5A);
  EXPECT_TRUE(copy.valid);
  EXPECT_EQ(copy.numSamples, 8u);

  copy = copy;  // self-assignment changes nothing
  EXPECT_EQ(copy.buffer.useCount(), 1);
  EXPECT_EQ(copy.getBuffer()[0], 0x5A);

  Aud::StreamBuffer other = blockWith(4, 1, 1);
  iMemHolder* previous = copy.buffer.get();
  copy = other;  // releases the reference it held
  EXPECT_NE(copy.buffer.get(), previous);
  EXPECT_EQ(other.buffer.useCount(), 2);
}

TEST(StreamBufferList, CopiesShareEveryBlock) {
  Aud::StreamBufferList list;
  EXPECT_TRUE(list.buffers.empty());
  EXPECT_EQ(list.numSamples, 0u);
  EXPECT_EQ(list.sampleType, -1);
  for (int c = 0; c < 3; ++c) list.buffers.push_back(blockWith(16, 1, static_cast<unsigned char>(c)));
  list.numSamples = 16;
  list.sampleType = 1;

  Aud::StreamBufferList copy(list);
  ASSERT_EQ(copy.buffers.size(), 3u);
  for (int c = 0; c < 3; ++c) {
    EXPECT_EQ(copy.buffers[c].getBuffer(), list.buffers[c].getBuffer());
    EXPECT_EQ(list.buffers[c].buffer.useCount(), 2);
  }
  EXPECT_EQ(copy.numSamples, 16u);
  EXPECT_EQ(copy.sampleType, 1);
  list = Aud::StreamBufferList();
  EXPECT_EQ(copy.buffers[2].buffer.useCount(), 1);
  EXPECT_EQ(copy.buffers[2].getBuffer()[0], 2);
}

}  // namespace
