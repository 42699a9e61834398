// AudioChannelCache keeps, per caller-chosen key, one sample block list and
// the stamp and extent that say what it holds, so that a caller asking again
// for the same material takes the blocks already made.
//
// The round: contains(req) says whether the entry for req.key has req.stamp
// and at least req.extent; when not, getBuffers(req) records the new stamp
// and extent and hands out the entry's list to fill; getResult(req) then
// shares block req.channel of it. Entries are made on first use of a key and
// live as long as the cache. Blocks are shared, never copied.
//
// No lock: one thread at a time per cache object.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <utility>

#include "host/OS.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"

struct TONEBITS_API AudioChannelCacheReq {
  uint32_t key = 0;      // selects the entry
  uint32_t channel = 0;  // the block getResult shares
  int64_t stamp = 0;     // must equal the entry's stamp for a hit
  uint32_t extent = 0;   // a hit needs it to be at most the entry's extent
};

class TONEBITS_API AudioChannelCache {
 public:
  AudioChannelCache() = default;
  AudioChannelCache(const AudioChannelCache& other) = default;
  AudioChannelCache& operator=(const AudioChannelCache& other) = default;
  ~AudioChannelCache() = default;

  // True when the entry for req.key exists, has req.stamp and an extent of
  // at least req.extent. Makes no entry.
  bool contains(const AudioChannelCacheReq& req) const noexcept;
  // The list of the entry for req.key (made empty when new), which takes
  // req.stamp and req.extent; the list keeps the blocks it held.
  Aud::StreamBufferList& getBuffers(const AudioChannelCacheReq& req);
  // Block req.channel of the entry for req.key, sharing its memory; an empty
  // block when there is no such entry or block. Makes no entry.
  Aud::StreamBuffer getResult(const AudioChannelCacheReq& req) const noexcept;

 private:
  struct Entry {
    Aud::StreamBufferList buffers;
    int64_t stamp = 0;
    uint32_t extent = 0;
  };
  std::map<uint32_t, Entry, std::less<uint32_t>, StdAllocator<std::pair<const uint32_t, Entry>>> entries_;
};
