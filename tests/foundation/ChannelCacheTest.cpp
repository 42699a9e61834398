#include <gtest/gtest.h>

#include <cstdint>
#include <memory>

#include "host/Ptr.h"
#include "tonebits/foundation/Aud__ChannelCache.h"

namespace {

AudioChannelCacheReq request(uint32_t key, int64_t stamp, uint32_t extent, uint32_t channel = 0) {
  return {key, channel, stamp, extent};
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
}

TEST(AudioChannelCache, HitsNeedTheSameStampAndNoMoreExtent) {
  AudioChannelCache cache;
  EXPECT_FALSE(cache.contains(request(3, 0, 0)));
  Aud::StreamBufferList& list = cache.getBuffers(request(3, 7, 1000));
  EXPECT_TRUE(list.buffers.empty());
  EXPECT_EQ(list.sampleType, -1);
  const std::pair<AudioChannelCacheReq, bool> rows[] = {
      {request(3, 7, 1000), true},  {request(3, 7, 0), true},    {request(3, 7, 1001), false},
      {request(3, 8, 1000), false}, {request(3, -7, 10), false}, {request(4, 7, 10), false}};
  for (const auto& [req, hit] : rows)
    EXPECT_EQ(cache.contains(req), hit) << req.key << "/" << req.stamp << "/" << req.extent;
  // Refilling keeps the list and records the new request; keys are
  // independent entries.
  fill(list, 2, 10);
  EXPECT_EQ(&cache.getBuffers(request(3, 6, 50)), &list);
  EXPECT_EQ(list.buffers.size(), 2u);
  EXPECT_FALSE(cache.contains(request(3, 7, 50)));
  EXPECT_TRUE(cache.contains(request(3, 6, 50)));
  fill(cache.getBuffers(request(0xFFFFFFFF, 1, 1)), 3, 20);
  EXPECT_EQ(cache.getResult(request(0xFFFFFFFF, 1, 1, 2)).getBuffer()[0], 22);
  EXPECT_EQ(cache.getResult(request(3, 6, 50, 1)).getBuffer()[0], 11);
}

TEST(AudioChannelCache, MissingEntryOrChannelGivesAnEmptyBlock) {
  AudioChannelCache cache;
  EXPECT_TRUE(cache.getResult(request(2, 0, 0)).buffer == nullptr);  // before any entry
  fill(cache.getBuffers(request(2, 1, 1)), 2, 0);
  for (const AudioChannelCacheReq& req :
       {request(2, 1, 1, 2), request(2, 1, 1, 0xFFFFFFFF), request(5, 1, 1)}) {
    const Aud::StreamBuffer block = cache.getResult(req);
    EXPECT_TRUE(block.buffer == nullptr);
    EXPECT_FALSE(block.valid);
    EXPECT_EQ(block.sampleType, -1);
    EXPECT_EQ(block.numSamples, 0u);
  }
  EXPECT_FALSE(cache.contains(request(5, 0, 0)));  // asking made no entry for key 5
}

TEST(AudioChannelCache, ResultsAndCopiesShareBlocksButNotEntries) {
  auto cache = std::make_unique<AudioChannelCache>();
  fill(cache->getBuffers(request(1, 1, 10)), 2, 50);
  AudioChannelCache copy(*cache);
  EXPECT_EQ(copy.getResult(request(1, 1, 10, 1)).getBuffer(),
            cache->getResult(request(1, 1, 10, 1)).getBuffer());
  copy.getBuffers(request(1, 2, 10)).buffers.clear();
  EXPECT_TRUE(cache->contains(request(1, 1, 10)));
  const Aud::StreamBuffer kept = cache->getResult(request(1, 1, 10, 1));
  EXPECT_TRUE(kept.valid);
  EXPECT_EQ(kept.numSamples, 4u);
  EXPECT_EQ(kept.buffer.useCount(), 2);  // the cache and the result
  cache.reset();
  EXPECT_EQ(kept.buffer.useCount(), 1);  // outlives the cache
  EXPECT_EQ(kept.getBuffer()[0], 51);
}

}  // namespace
