#include "AudioIO.h"

#include <algorithm>
#include <cstring>

#include "Cli.h"

#include "tonebits/foundation/Aud__SampleConversion.h"

namespace cli {

namespace {

constexpr std::size_t kBlockFrames = 1 << 14;

WString wide(const std::string& s) { return Kv::WStringFromAscii(s.c_str()); }

}  // namespace

PlanarBlock::PlanarBlock(unsigned channels, std::size_t frames)
    : channels_(channels),
      capacity_(frames),
      stride_((frames + 15) & ~std::size_t(15)),
      data_(stride_ * channels) {}

std::vector<float*> PlanarBlock::pointers() {
  std::vector<float*> p(channels_);
  for (unsigned c = 0; c < channels_; ++c) p[c] = channel(c);
  return p;
}

Aud::Metadata metadataOf(const WaveReader& reader) {
  const WaveFormat& f = reader.format();
  WavHeaderEx header{};
  header.wFormatTag = f.coding == WaveCoding::Float ? 3 : 1;  // the sub-format of an extensible header
  header.nChannels = f.channels;
  header.nSamplesPerSec = f.sampleRate;
  header.nAvgBytesPerSec = f.sampleRate * f.blockAlign;
  header.nBlockAlign = f.blockAlign;
  header.wBitsPerSample = f.bitsPerSample;
  header.cbSize = 0;
  Aud::Metadata m;
  m.getFromWAVFORMATEX(header, 1);
  return m;
}

PlanarReader::PlanarReader(const std::string& path, bool allowTruncated) : wave_(path) {
  if (wave_.truncated() && !allowTruncated)
    throw WaveError(WaveError::Truncated, "'" + path + "': the data chunk is truncated (" +
                                              std::to_string(wave_.frames()) + " of " +
                                              std::to_string(wave_.claimedFrames()) +
                                              " frames present); --allow-truncated processes what is there");
  metadata_ = metadataOf(wave_);
  if (metadata_.getSampleTypeNumber() < 0)
    throw WaveError(WaveError::Unsupported, "'" + path + "': no sample type reads this coding");
  interleaver_.setAudioFormat(metadata_);
  blockFrames_ = kBlockFrames;
  bytes_ = Kv::Ptr<iMemHolder>(new ByteBufferImpl(blockFrames_ * wave_.format().blockAlign));
}

std::size_t PlanarReader::readAt(uint64_t first, PlanarBlock& block, std::size_t count) {
  wave_.seek(first);
  std::size_t done = 0;
  while (done < count) {
    PlanarBlock& b = block;
    const std::size_t want = std::min(count - done, blockFrames_);
    const std::size_t got = readInto(b, done, want);
    if (got == 0) break;
    done += got;
  }
  return done;
}

std::size_t PlanarReader::read(PlanarBlock& block) {
  return readInto(block, 0, block.capacity() < blockFrames_ ? block.capacity() : blockFrames_);
}

std::size_t PlanarReader::readInto(PlanarBlock& block, std::size_t offset, std::size_t want) {
  const std::size_t got = wave_.read(bytes_->getBuffer(), want);
  if (got == 0) return 0;
  bytes_->setUsed(got * wave_.format().blockAlign);
  if (interleaver_.deinterleaveAudio(bytes_, list_) != AudioInterleaver::eOk || list_.numSamples != got)
    throw WaveError(WaveError::Unsupported, "the interleaver refused this layout");
  for (unsigned c = 0; c < channels(); ++c)
    Aud::convertToFloat(list_.sampleType, list_.buffers[c].getBuffer(), block.channel(c) + offset, got);
  return got;
}

void checkOutput(const std::string& in, const std::string& out) {
  if (in == out || sameFile(in, out)) throw UsageError("refusing to overwrite the input '" + in + "'");
}

int exportTypeFromName(const std::string& name) {
  for (int type : Aud::getExportChoicesAsInt())
    if (Aud::getAsString(type) == wide(name)) return type;
  std::string choices;
  for (const WString& w : Aud::getExportChoices())
    choices += (choices.empty() ? "\"" : ", \"") + std::string(String(w)) + "\"";
  throw UsageError("unknown sample type \"" + name + "\" (choose " + choices + ")");
}

std::string sampleTypeName(int sampleType) { return std::string(String(Aud::getAsString(sampleType))); }

WaveFormat PlanarWriter::formatFor(unsigned channels, uint32_t sampleRate, int sampleType) {
  WavHeaderEx header{};
  Aud::Metadata(1, channels, sampleRate, sampleType).setWAVFORMATEX(header);
  WaveFormat f;
  f.coding = WaveCoding::Pcm;
  f.channels = header.nChannels;
  f.sampleRate = header.nSamplesPerSec;
  f.blockAlign = header.nBlockAlign;
  // A WAVE container is whole bytes per sample. 24 bits in a 4-byte slot are
  // written as 32-bit samples whose low byte is zero: the same values, and a
  // form every reader takes (several refuse padded containers).
  f.bitsPerSample = static_cast<uint16_t>(header.nBlockAlign / header.nChannels * 8);
  f.validBitsPerSample = f.bitsPerSample;
  f.channelMask = channels == 1 ? 0x4 : channels == 2 ? 0x3 : 0;
  return f;
}

PlanarWriter::PlanarWriter(const std::string& path, unsigned channels, uint32_t sampleRate, int sampleType)
    : sampleType_(sampleType),
      channels_(channels),
      wave_(path, formatFor(channels, sampleRate, sampleType)),
      interleaver_(sampleType, channels, Aud::eDataType(201)) {}

void PlanarWriter::write(const PlanarBlock& block, std::size_t frames) {
  if (frames == 0) return;
  const unsigned bytes = Aud::bytesPerSampleOfType(sampleType_);
  typed_.resize(std::size_t(channels_) * frames * bytes);
  std::vector<const unsigned char*> planes(channels_);
  for (unsigned c = 0; c < channels_; ++c) {
    unsigned char* plane = typed_.data() + std::size_t(c) * frames * bytes;
    Aud::convertFromFloat(sampleType_, block.channel(c), plane, frames);
    planes[c] = plane;
  }
  if (interleaver_.writeSamplesPlanar(planes, static_cast<unsigned>(frames)) != AudioInterleaver::eOk)
    throw WaveError(WaveError::Io, "the interleaver refused the export block");
  const unsigned char* out = interleaver_.getOutputBuffer();
  const std::size_t outBytes = std::size_t(channels_) * frames * bytes;
  if (sampleType_ == 5) {
    // In a WAVE file the 24 significant bits of a 4-byte slot sit at its top.
    typed_.resize(outBytes);
    for (std::size_t i = 0; i < outBytes; i += 4) {
      typed_[i] = 0;
      std::memcpy(&typed_[i + 1], out + i, 3);
    }
    out = typed_.data();
  }
  wave_.write(out, frames);
}

}  // namespace cli
