#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <memory>

#include "host/Ptr.h"
#include "tonebits/foundation/Aud__ChannelCache.h"

namespace {

AudioChannelCacheReq request(uint32_t key, int64_t stamp, uint32_t extent, uint32_t channel = 0) {
  AudioChannelCacheReq req;
  req.key = key;
  req.channel = channel;
  req.stamp = stamp;
  req.extent = extent;
  return req;
}

// A list of blocks whose first byte is the channel number plus base.
void fill(Aud::StreamBufferList& list, unsigned channels, uint8_t base) {
  list.buffers.clear();
  for (unsigned c = 0; c < channels; ++c) {
    Aud::StreamBuffer block(0, 4, 1);
    block.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(8));
    block.buffer->getBuffer()[0] = uint8_t(base + c);
    block.valid = true;
    list.buffers.push_back(block);
  }
  list.numSamples = 4;
  list.sampleType = 1;
}

TEST(AudioChannelCache, HitsNeedTheSameStampAndNoMoreExtent) {
  AudioChannelCache cache;
  EXPECT_FALSE(cache.contains(request(3, 0, 0)));
  EXPECT_FALSE(cache.contains(request(3, 0, 0)));  // asking made no entry
  EXPECT_TRUE(cache.getResult(request(3, 0, 0)).buffer == nullptr);

  Aud::StreamBufferList& list = cache.getBuffers(request(3, 7, 1000));
  EXPECT_TRUE(list.buffers.empty());
  EXPECT_EQ(list.numSamples, 0u);
  EXPECT_EQ(list.sampleType, -1);
  struct Row {
    uint32_t key;
    int64_t stamp;
    uint32_t extent;
    bool hit;
  };
  const Row rows[] = {{3, 7, 1000, true},  {3, 7, 500, true},  {3, 7, 0, true},   {3, 7, 1001, false},
                      {3, 8, 1000, false}, {3, -7, 10, false}, {4, 7, 10, false}, {0xFFFFFFFF, 7, 10, false}};
  for (const Row& row : rows)
    EXPECT_EQ(cache.contains(request(row.key, row.stamp, row.extent)), row.hit)
        << row.key << "/" << row.stamp << "/" << row.extent;
}

TEST(AudioChannelCache, RefillingKeepsTheListAndRecordsTheNewRequest) {
  AudioChannelCache cache;
  Aud::StreamBufferList& first = cache.getBuffers(request(1, 5, 100));
  fill(first, 2, 10);
  Aud::StreamBufferList& second = cache.getBuffers(request(1, 6, 50));
  EXPECT_EQ(&first, &second);
  EXPECT_EQ(second.buffers.size(), 2u);
  EXPECT_FALSE(cache.contains(request(1, 5, 50)));
  EXPECT_TRUE(cache.contains(request(1, 6, 50)));
  EXPECT_FALSE(cache.contains(request(1, 6, 51)));

  // Keys are independent entries, kept in their own lists.
  fill(cache.getBuffers(request(0xFFFFFFFF, 1, 1)), 3, 20);
  fill(cache.getBuffers(request(0, 1, 1)), 1, 30);
  EXPECT_EQ(cache.getResult(request(0xFFFFFFFF, 1, 1, 2)).getBuffer()[0], 22);
  EXPECT_EQ(cache.getResult(request(0, 1, 1, 0)).getBuffer()[0], 30);
  EXPECT_EQ(cache.getResult(request(1, 6, 50, 1)).getBuffer()[0], 11);
}

TEST(AudioChannelCache, ResultsShareMemoryAndOutliveTheCache) {
  Aud::StreamBuffer kept;
  {
    auto cache = std::make_unique<AudioChannelCache>();
    fill(cache->getBuffers(request(9, 1, 1)), 2, 40);
    kept = cache->getResult(request(9, 1, 1, 1));
    EXPECT_EQ(kept.getBuffer(), cache->getBuffers(request(9, 1, 1)).buffers[1].getBuffer());
    EXPECT_TRUE(kept.valid);
    EXPECT_EQ(kept.numSamples, 4u);
  }
  EXPECT_EQ(kept.buffer.useCount(), 1);
  EXPECT_EQ(kept.getBuffer()[0], 41);
}

TEST(AudioChannelCache, MissingEntryOrChannelGivesAnEmptyBlock) {
  AudioChannelCache cache;
  fill(cache.getBuffers(request(2, 1, 1)), 2, 0);
  for (const AudioChannelCacheReq& req :
       {request(2, 1, 1, 2), request(2, 1, 1, 0xFFFFFFFF), request(5, 1, 1, 0)}) {
    const Aud::StreamBuffer block = cache.getResult(req);
    EXPECT_TRUE(block.buffer == nullptr);
    EXPECT_FALSE(block.valid);
    EXPECT_EQ(block.sampleType, -1);
    EXPECT_EQ(block.numSamples, 0u);
  }
  EXPECT_FALSE(cache.contains(request(5, 0, 0)));  // no entry was made for key 5
  EXPECT_EQ(cache.getBuffers(request(5, 0, 0)).buffers.size(), 0u);
}

TEST(AudioChannelCache, CopiesShareBlocksButNotEntries) {
  AudioChannelCache cache;
  fill(cache.getBuffers(request(1, 1, 10)), 2, 50);
  AudioChannelCache copy(cache);
  AudioChannelCache assigned;
  assigned = cache;
  const AudioChannelCache& self = assigned;
  assigned = self;
  for (AudioChannelCache* other : {&copy, &assigned}) {
    EXPECT_TRUE(other->contains(request(1, 1, 10)));
    EXPECT_EQ(other->getResult(request(1, 1, 10, 1)).getBuffer(),
              cache.getResult(request(1, 1, 10, 1)).getBuffer());
  }
  copy.getBuffers(request(1, 2, 10)).buffers.clear();
  EXPECT_TRUE(cache.contains(request(1, 1, 10)));
  EXPECT_EQ(cache.getResult(request(1, 1, 10, 1)).getBuffer()[0], 51);
  EXPECT_EQ(cache.getResult(request(1, 1, 10, 1)).buffer.useCount(), 3);  // cache, assigned, the result
}

}  // namespace
