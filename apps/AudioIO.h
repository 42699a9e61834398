// Planar float audio in and out of WAVE files, through the library's own
// format description, interleaver and block conversions.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "WaveFile.h"
#include "host/Ptr.h"
#include "tonebits/foundation/Aud__Interleaver.h"
#include "tonebits/foundation/Aud__Metadata.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"

namespace cli {

// Planar float channels of one block.
class PlanarBlock {
 public:
  PlanarBlock(unsigned channels, std::size_t frames);
  unsigned channels() const { return channels_; }
  std::size_t capacity() const { return capacity_; }
  float* channel(unsigned c) { return data_.data() + c * stride_; }
  const float* channel(unsigned c) const { return data_.data() + c * stride_; }
  std::vector<float*> pointers();

 private:
  unsigned channels_;
  std::size_t capacity_, stride_;
  std::vector<float> data_;
};

// The library's description of a file's format.
Aud::Metadata metadataOf(const WaveReader& reader);

class PlanarReader {
 public:
  // allowTruncated: read what a truncated file holds instead of refusing it.
  PlanarReader(const std::string& path, bool allowTruncated);
  const WaveReader& wave() const { return wave_; }
  const Aud::Metadata& metadata() const { return metadata_; }
  unsigned channels() const { return wave_.format().channels; }
  uint32_t sampleRate() const { return wave_.format().sampleRate; }
  uint64_t frames() const { return wave_.frames(); }
  // Reads up to block.capacity() frames; returns the frames read.
  std::size_t read(PlanarBlock& block);
  // Reads count frames from frame first (count at most block.capacity()).
  std::size_t readAt(uint64_t first, PlanarBlock& block, std::size_t count);

 private:
  std::size_t readInto(PlanarBlock& block, std::size_t offset, std::size_t want);
  WaveReader wave_;
  Aud::Metadata metadata_;
  AudioInterleaver interleaver_;
  Kv::Ptr<iMemHolder> bytes_;
  Aud::StreamBufferList list_;
  std::size_t blockFrames_ = 0;
};

// Refuses an output that names the input.
void checkOutput(const std::string& in, const std::string& out);

// The export sample types and their names.
int exportTypeFromName(const std::string& name);
std::string sampleTypeName(int sampleType);

class PlanarWriter {
 public:
  // sampleType is one of the export choices (1, 2, 5).
  PlanarWriter(const std::string& path, unsigned channels, uint32_t sampleRate, int sampleType);
  void write(const PlanarBlock& block, std::size_t frames);
  void commit() { wave_.commit(); }

 private:
  static WaveFormat formatFor(unsigned channels, uint32_t sampleRate, int sampleType);
  int sampleType_;
  unsigned channels_;
  WaveWriter wave_;
  AudioInterleaver interleaver_;
  std::vector<unsigned char> typed_;
};

}  // namespace cli
