#include <gtest/gtest.h>

#include "tonebits/foundation/Aud__StreamBuffer.h"

namespace {

TEST(StreamBuffer, EmptyBlocksHaveNoMemoryAndCopiesShareIt) {
  const Aud::StreamBuffer empty, sized(5, 100, 1);
  EXPECT_FALSE(empty.valid);
  EXPECT_EQ(empty.sampleType, -1);
  EXPECT_EQ(empty.getBuffer(), nullptr);  // no memory: null, never a dereference
  EXPECT_EQ(empty.getBufferSize(), 0u);
  EXPECT_EQ(sized.tag, 5u);
  EXPECT_EQ(sized.numSamples, 100u);
  EXPECT_EQ(sized.getBuffer(), nullptr);

  Aud::StreamBufferList copy;
  {
    Aud::StreamBufferList list;
    EXPECT_EQ(list.sampleType, -1);
    for (int c = 0; c < 3; ++c) {
      list.buffers.emplace_back(0, 16, 1);
      list.buffers[c].buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(32));
      list.buffers[c].getBuffer()[31] = static_cast<unsigned char>(c);
    }
    list.numSamples = 16;
    copy = list;
    EXPECT_EQ(copy.buffers[2].getBuffer(), list.buffers[2].getBuffer());
    EXPECT_EQ(list.buffers[2].buffer.useCount(), 2);
  }
  EXPECT_EQ(copy.numSamples, 16u);
  EXPECT_EQ(copy.buffers[2].buffer.useCount(), 1);  // the memory outlives the original
  EXPECT_EQ(copy.buffers[2].getBuffer()[31], 2);
  Aud::StreamBuffer& first = copy.buffers[0];
  first = copy.buffers[0];  // self-assignment changes nothing
  EXPECT_EQ(first.buffer.useCount(), 1);
  EXPECT_EQ(first.getBuffer()[31], 0);
  first = copy.buffers[1];  // releases the reference it held
  EXPECT_EQ(copy.buffers[1].buffer.useCount(), 2);
}

}  // namespace
