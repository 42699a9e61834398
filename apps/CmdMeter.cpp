// tonebits meter FILE: per-channel peaks and clips, read the way a level
// meter reads them: the file is fed to an input monitor in 10 ms blocks in
// its own sample form, and a reader on each input's monitoring point takes
// the peak of every block.
#include <algorithm>
#include <cmath>
#include <cstdio>

#include "AudioIO.h"
#include "Cli.h"
#include "Commands.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/metering/Aud__Monitor.h"
#include "tonebits/metering/Aud__MonitoringPoint.h"
#include "tonebits/metering/Aud__MonitoringPointManager.h"

namespace cli {

namespace {

const char* kHelp =
    "usage: tonebits meter FILE [--allow-truncated] [--quiet]\n"
    "\n"
    "Prints each channel's peak in dBFS and its clips: the 10 ms blocks whose\n"
    "peak passed the clip threshold (0.99), with a bar per channel.\n";

// A window onto part of another holder's memory, so that the monitor can be
// fed short blocks out of one large read without copying.
class MemoryWindow : public iMemHolder {
 public:
  void set(unsigned char* data, std::size_t size) {
    data_ = data;
    size_ = size;
  }
  unsigned char* getBuffer() const noexcept override { return data_; }
  std::size_t getSize() const noexcept override { return size_; }
  std::size_t getUsed() const noexcept override { return size_; }
  void setUsed(std::size_t) noexcept override {}

 private:
  unsigned char* data_ = nullptr;
  std::size_t size_ = 0;
};

// The device side: one monitoring point per channel of the file.
class FileMonitor : public Aud::Monitor {
 public:
  explicit FileMonitor(unsigned channels) { registerMonitoringPoints(channels); }
  virtual ~FileMonitor() {
    for (const IdStamp& writer : inputWriterIds) Aud::MonitoringPointManager::unregisterMP(writer);
  }
  void feed(Aud::StreamBufferList& block) { updateMonitoringPoints(block); }
};

}  // namespace

int runMeter(int argc, char** argv, int first) {
  Args args(argc, argv, first, {}, {"help", "allow-truncated", "quiet"});
  if (args.has("help")) {
    std::fputs(kHelp, stdout);
    return kOk;
  }
  if (args.positional().size() != 1) throw UsageError("meter takes one FILE");
  const std::string path = args.positional()[0];

  WaveReader wave(path);
  if (wave.truncated() && !args.has("allow-truncated"))
    throw WaveError(WaveError::Truncated, "'" + path + "': the data chunk is truncated (" +
                                              std::to_string(wave.frames()) + " of " +
                                              std::to_string(wave.claimedFrames()) + " frames present)");
  const Aud::Metadata metadata = metadataOf(wave);
  AudioInterleaver interleaver;
  interleaver.setAudioFormat(metadata);
  const unsigned channels = wave.format().channels;
  const std::size_t interval = std::max<std::size_t>(1, wave.format().sampleRate / 100);
  const std::size_t readFrames = interval * 64;

  FileMonitor monitor(channels);
  std::vector<Aud::MonitoringPointReader> readers;
  for (unsigned c = 0; c < channels; ++c) readers.emplace_back(monitor.getInputMonitoringPointId(c));

  Kv::Ptr<iMemHolder> bytes(new ByteBufferImpl(readFrames * wave.format().blockAlign));
  Aud::StreamBufferList planar, window;
  std::vector<MemoryWindow*> windows;
  for (unsigned c = 0; c < channels; ++c) {
    auto* w = new MemoryWindow;
    windows.push_back(w);
    Aud::StreamBuffer b;
    b.buffer = Kv::Ptr<iMemHolder>(w);
    b.valid = true;
    window.buffers.push_back(b);
  }
  std::vector<float> peaks(channels, 0.0f);
  std::vector<uint64_t> clips(channels, 0);
  Progress progress("metering", wave.frames(), args.has("quiet"));

  for (std::size_t got; (got = wave.read(bytes->getBuffer(), readFrames)) > 0;) {
    bytes->setUsed(got * wave.format().blockAlign);
    if (interleaver.deinterleaveAudio(bytes, planar) != AudioInterleaver::eOk)
      throw WaveError(WaveError::Unsupported, "'" + path + "': the interleaver refused this layout");
    const unsigned sampleBytes = Aud::bytesPerSampleOfType(planar.sampleType);
    window.sampleType = planar.sampleType;
    for (std::size_t start = 0; start < got; start += interval) {
      const std::size_t n = std::min(interval, got - start);
      window.numSamples = static_cast<uint32_t>(n);
      for (unsigned c = 0; c < channels; ++c) {
        windows[c]->set(planar.buffers[c].getBuffer() + start * sampleBytes, n * sampleBytes);
        window.buffers[c].numSamples = window.numSamples;
        window.buffers[c].sampleType = window.sampleType;
      }
      monitor.feed(window);
      for (unsigned c = 0; c < channels; ++c) {
        if (readers[c].hasClipped(true)) ++clips[c];
        peaks[c] = std::max(peaks[c], readers[c].peakValue(true));
      }
    }
    progress.update(wave.position());
  }
  progress.finish();

  std::printf("%s: %u channel%s, %s\n", path.c_str(), channels, channels == 1 ? "" : "s",
              sampleTypeName(metadata.getSampleTypeNumber()).c_str());
  for (unsigned c = 0; c < channels; ++c) {
    const double db = peaks[c] > 0 ? 20.0 * std::log10(peaks[c]) : -HUGE_VAL;
    const int bar = db <= -60.0 ? 0 : std::min(40, static_cast<int>((db + 60.0) * 40.0 / 60.0 + 0.5));
    std::printf("  ch %-2u peak %8s dBFS  clips %-6llu |%.*s%*s|\n", c + 1, formatDb(peaks[c]).c_str(),
                static_cast<unsigned long long>(clips[c]), bar, "########################################",
                40 - bar, "");
  }
  if (wave.truncated())
    std::fprintf(stderr, "warning: '%s' is truncated; metered what is there\n", path.c_str());
  return kOk;
}

}  // namespace cli
