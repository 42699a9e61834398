#include "tonebits/foundation/Aud__ChannelCache.h"

bool AudioChannelCache::contains(const AudioChannelCacheReq& req) const noexcept {
  const auto found = entries_.find(req.key);
  return found != entries_.end() && found->second.stamp == req.stamp && req.extent <= found->second.extent;
}

Aud::StreamBufferList& AudioChannelCache::getBuffers(const AudioChannelCacheReq& req) {
  Entry& entry = entries_[req.key];
  entry.stamp = req.stamp;
  entry.extent = req.extent;
  return entry.buffers;
}

Aud::StreamBuffer AudioChannelCache::getResult(const AudioChannelCacheReq& req) const noexcept {
  const auto found = entries_.find(req.key);
  if (found == entries_.end() || req.channel >= found->second.buffers.buffers.size())
    return Aud::StreamBuffer();
  return found->second.buffers.buffers[req.channel];
}
