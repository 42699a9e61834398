// RIFF/WAVE reading and writing for the command-line tool, streamed in
// blocks so memory stays flat whatever the file length.
//
// The reader accepts WAVE_FORMAT_PCM, WAVE_FORMAT_IEEE_FLOAT and
// WAVE_FORMAT_EXTENSIBLE with a PCM or float sub-format; other chunks are
// skipped (odd sizes padded). A data chunk that claims more bytes than the
// file holds is reported as truncated. The writer writes to a temporary file
// beside the destination and renames it into place only on commit(), so a
// failed run never leaves a partial output.
#pragma once

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

namespace cli {

enum class WaveCoding { Pcm, Float };

struct WaveFormat {
  WaveCoding coding = WaveCoding::Pcm;
  uint16_t formatTag = 1;  // as stored: 1, 3 or 0xFFFE
  uint16_t channels = 0;
  uint32_t sampleRate = 0;
  uint16_t blockAlign = 0;
  uint16_t bitsPerSample = 0;       // container bits
  uint16_t validBitsPerSample = 0;  // significant bits (extensible), else = bitsPerSample
  uint32_t channelMask = 0;

  uint32_t bytesPerSample() const { return channels ? blockAlign / channels : 0; }
};

class WaveError : public std::exception {
 public:
  enum Kind { Io = 2, NotWave = 3, Unsupported = 4, Truncated = 5 };
  WaveError(Kind kind, std::string message) : kind_(kind), message_(std::move(message)) {}
  const char* what() const noexcept override { return message_.c_str(); }
  Kind kind() const noexcept { return kind_; }

 private:
  Kind kind_;
  std::string message_;
};

class WaveReader {
 public:
  // Throws WaveError when the file is missing, not WAVE, or of a coding the
  // tool does not read.
  explicit WaveReader(const std::string& path);
  ~WaveReader();
  WaveReader(const WaveReader&) = delete;
  WaveReader& operator=(const WaveReader&) = delete;

  const WaveFormat& format() const { return format_; }
  // Whole frames the file holds (what the data chunk claims, cut to the file).
  uint64_t frames() const { return frames_; }
  // True when the data chunk claims more than the file holds.
  bool truncated() const { return truncated_; }
  uint64_t claimedFrames() const { return claimedFrames_; }
  // The raw fmt chunk as stored (at least 16 bytes).
  const std::vector<unsigned char>& fmtChunk() const { return fmtChunk_; }

  // Reads up to maxFrames interleaved frames; returns the frames read.
  std::size_t read(unsigned char* dst, std::size_t maxFrames);
  // Moves the read position to a frame (at most frames()).
  void seek(uint64_t frame);
  uint64_t position() const { return position_; }

 private:
  std::FILE* file_ = nullptr;
  WaveFormat format_;
  std::vector<unsigned char> fmtChunk_;
  uint64_t dataOffset_ = 0;
  uint64_t frames_ = 0;
  uint64_t claimedFrames_ = 0;
  uint64_t position_ = 0;
  bool truncated_ = false;
};

class WaveWriter {
 public:
  // Opens a temporary file beside path; writes WAVE_FORMAT_EXTENSIBLE when the
  // format has more than two channels or more than 16 bits.
  WaveWriter(const std::string& path, const WaveFormat& format);
  ~WaveWriter();  // removes the temporary file unless committed
  WaveWriter(const WaveWriter&) = delete;
  WaveWriter& operator=(const WaveWriter&) = delete;

  void write(const unsigned char* frames, std::size_t count);
  // Completes the header and renames the file into place.
  void commit();
  uint64_t framesWritten() const { return frames_; }

 private:
  void writeHeader();
  std::string path_, tempPath_;
  std::FILE* file_ = nullptr;
  WaveFormat format_;
  uint64_t frames_ = 0;
  bool committed_ = false;
  bool extensible_ = false;
};

// True when a and b name the same existing file.
bool sameFile(const std::string& a, const std::string& b);

}  // namespace cli
