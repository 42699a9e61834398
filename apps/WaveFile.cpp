#include "WaveFile.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace cli {

namespace {

// The tail shared by the PCM and float sub-format GUIDs.
constexpr unsigned char kGuidTail[14] = {0x00, 0x00, 0x00, 0x00, 0x10, 0x00, 0x80,
                                         0x00, 0x00, 0xAA, 0x00, 0x38, 0x9B, 0x71};

uint16_t le16(const unsigned char* p) { return uint16_t(p[0] | (p[1] << 8)); }
uint32_t le32(const unsigned char* p) {
  return uint32_t(p[0]) | (uint32_t(p[1]) << 8) | (uint32_t(p[2]) << 16) | (uint32_t(p[3]) << 24);
}
void put16(std::vector<unsigned char>& v, uint32_t x) {
  v.push_back(uint8_t(x));
  v.push_back(uint8_t(x >> 8));
}
void put32(std::vector<unsigned char>& v, uint32_t x) {
  put16(v, x & 0xFFFF);
  put16(v, x >> 16);
}

std::string describe(const std::string& path) { return "'" + path + "'"; }

}  // namespace

WaveReader::WaveReader(const std::string& path) {
  file_ = std::fopen(path.c_str(), "rb");
  if (!file_) throw WaveError(WaveError::Io, describe(path) + ": " + std::strerror(errno));
  struct stat st {};
  fstat(fileno(file_), &st);
  const uint64_t fileSize = static_cast<uint64_t>(st.st_size);

  unsigned char riff[12];
  if (std::fread(riff, 1, 12, file_) != 12 || std::memcmp(riff, "RIFF", 4) != 0 ||
      std::memcmp(riff + 8, "WAVE", 4) != 0)
    throw WaveError(WaveError::NotWave, describe(path) + " is not a RIFF/WAVE file");

  bool haveFmt = false, haveData = false;
  uint64_t dataBytes = 0;
  uint64_t pos = 12;
  while (pos + 8 <= fileSize && !(haveFmt && haveData)) {
    unsigned char header[8];
    if (std::fseek(file_, static_cast<long>(pos), SEEK_SET) != 0 || std::fread(header, 1, 8, file_) != 8)
      break;
    const uint32_t size = le32(header + 4);
    const uint64_t body = pos + 8;
    if (std::memcmp(header, "fmt ", 4) == 0) {
      if (size < 16 || size > 4096 || body + size > fileSize)
        throw WaveError(WaveError::NotWave, describe(path) + ": malformed fmt chunk");
      fmtChunk_.resize(size);
      if (std::fread(fmtChunk_.data(), 1, size, file_) != size)
        throw WaveError(WaveError::Io, describe(path) + ": cannot read the fmt chunk");
      haveFmt = true;
    } else if (std::memcmp(header, "data", 4) == 0) {
      dataOffset_ = body;
      // 0xFFFFFFFF is what a writer that never finished leaves: read to the end.
      dataBytes = size == 0xFFFFFFFFu ? fileSize - body : size;
      haveData = true;
    }
    pos = body + uint64_t(size) + (size & 1u);
  }
  if (!haveFmt) throw WaveError(WaveError::NotWave, describe(path) + ": no fmt chunk");
  if (!haveData) throw WaveError(WaveError::NotWave, describe(path) + ": no data chunk");

  const unsigned char* f = fmtChunk_.data();
  format_.formatTag = le16(f);
  format_.channels = le16(f + 2);
  format_.sampleRate = le32(f + 4);
  format_.blockAlign = le16(f + 12);
  format_.bitsPerSample = le16(f + 14);
  format_.validBitsPerSample = format_.bitsPerSample;
  uint16_t tag = format_.formatTag;
  if (tag == 0xFFFE) {
    if (fmtChunk_.size() < 40 || le16(f + 16) < 22)
      throw WaveError(WaveError::NotWave, describe(path) + ": malformed extensible fmt chunk");
    format_.validBitsPerSample = le16(f + 18);
    format_.channelMask = le32(f + 20);
    if (std::memcmp(f + 26, kGuidTail, sizeof kGuidTail) != 0)
      throw WaveError(WaveError::Unsupported, describe(path) + ": unsupported sub-format");
    tag = le16(f + 24);
  }
  const unsigned bits = format_.bitsPerSample;
  if (tag == 1 && (bits == 8 || bits == 16 || bits == 24 || bits == 32)) {
    format_.coding = WaveCoding::Pcm;
  } else if (tag == 3 && (bits == 32 || bits == 64)) {
    format_.coding = WaveCoding::Float;
  } else {
    throw WaveError(WaveError::Unsupported, describe(path) + ": unsupported coding (format tag " +
                                                std::to_string(tag) + ", " + std::to_string(bits) + " bits)");
  }
  if (format_.channels == 0 || format_.channels > 32 || format_.sampleRate == 0 ||
      format_.blockAlign != format_.channels * (bits / 8))
    throw WaveError(WaveError::Unsupported, describe(path) + ": unsupported layout (" +
                                                std::to_string(format_.channels) + " channels, block align " +
                                                std::to_string(format_.blockAlign) + ")");

  const uint64_t available = dataOffset_ <= fileSize ? fileSize - dataOffset_ : 0;
  claimedFrames_ = dataBytes / format_.blockAlign;
  frames_ = (dataBytes <= available ? dataBytes : available) / format_.blockAlign;
  truncated_ = dataBytes > available;
  if (std::fseek(file_, static_cast<long>(dataOffset_), SEEK_SET) != 0)
    throw WaveError(WaveError::Io, describe(path) + ": cannot seek to the data");
}

WaveReader::~WaveReader() {
  if (file_) std::fclose(file_);
}

std::size_t WaveReader::read(unsigned char* dst, std::size_t maxFrames) {
  const uint64_t left = frames_ - position_;
  const std::size_t want = static_cast<std::size_t>(maxFrames < left ? maxFrames : left);
  if (want == 0) return 0;
  const std::size_t got = std::fread(dst, format_.blockAlign, want, file_);
  position_ += got;
  return got;
}

void WaveReader::seek(uint64_t frame) {
  if (frame > frames_) frame = frames_;
  if (std::fseek(file_, static_cast<long>(dataOffset_ + frame * format_.blockAlign), SEEK_SET) != 0)
    throw WaveError(WaveError::Io, "cannot seek in the input");
  position_ = frame;
}

WaveWriter::WaveWriter(const std::string& path, const WaveFormat& format) : path_(path), format_(format) {
  extensible_ = format_.channels > 2 || format_.bitsPerSample > 16;
  tempPath_ = path + ".tmp-" + std::to_string(getpid());
  file_ = std::fopen(tempPath_.c_str(), "wb");
  if (!file_) throw WaveError(WaveError::Io, describe(path) + ": " + std::strerror(errno));
  writeHeader();
}

WaveWriter::~WaveWriter() {
  if (file_) std::fclose(file_);
  if (!committed_) std::remove(tempPath_.c_str());
}

void WaveWriter::writeHeader() {
  const uint32_t dataBytes = static_cast<uint32_t>(frames_ * format_.blockAlign);
  std::vector<unsigned char> h;
  const uint32_t fmtSize = extensible_ ? 40 : 16;
  h.insert(h.end(), {'R', 'I', 'F', 'F'});
  put32(h, 4 + (8 + fmtSize) + (8 + dataBytes + (dataBytes & 1u)));
  h.insert(h.end(), {'W', 'A', 'V', 'E', 'f', 'm', 't', ' '});
  put32(h, fmtSize);
  const uint16_t baseTag = format_.coding == WaveCoding::Float ? 3 : 1;
  put16(h, extensible_ ? 0xFFFE : baseTag);
  put16(h, format_.channels);
  put32(h, format_.sampleRate);
  put32(h, format_.sampleRate * format_.blockAlign);
  put16(h, format_.blockAlign);
  put16(h, format_.bitsPerSample);
  if (extensible_) {
    put16(h, 22);
    put16(h, format_.validBitsPerSample ? format_.validBitsPerSample : format_.bitsPerSample);
    put32(h, format_.channelMask);
    put16(h, baseTag);
    h.insert(h.end(), kGuidTail, kGuidTail + sizeof kGuidTail);
  }
  h.insert(h.end(), {'d', 'a', 't', 'a'});
  put32(h, dataBytes);
  if (std::fseek(file_, 0, SEEK_SET) != 0 || std::fwrite(h.data(), 1, h.size(), file_) != h.size())
    throw WaveError(WaveError::Io, describe(path_) + ": write failed");
}

void WaveWriter::write(const unsigned char* frames, std::size_t count) {
  if (count == 0) return;
  if (uint64_t(frames_ + count) * format_.blockAlign > 0xFFFFFFF0ull)
    throw WaveError(WaveError::Io, describe(path_) + ": output would exceed the 4 GiB limit of a WAVE file");
  if (std::fwrite(frames, format_.blockAlign, count, file_) != count)
    throw WaveError(WaveError::Io, describe(path_) + ": write failed: " + std::strerror(errno));
  frames_ += count;
}

void WaveWriter::commit() {
  const uint64_t dataBytes = frames_ * format_.blockAlign;
  if (dataBytes & 1u) std::fputc(0, file_);  // chunks are padded to even sizes
  writeHeader();
  const bool ok = std::fflush(file_) == 0 && fsync(fileno(file_)) == 0;
  std::fclose(file_);
  file_ = nullptr;
  if (!ok || std::rename(tempPath_.c_str(), path_.c_str()) != 0)
    throw WaveError(WaveError::Io, describe(path_) + ": cannot complete the file: " + std::strerror(errno));
  committed_ = true;
}

bool sameFile(const std::string& a, const std::string& b) {
  struct stat sa {
  }, sb{};
  if (stat(a.c_str(), &sa) != 0 || stat(b.c_str(), &sb) != 0) return false;
  return sa.st_dev == sb.st_dev && sa.st_ino == sb.st_ino;
}

}  // namespace cli
