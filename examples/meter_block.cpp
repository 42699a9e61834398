// Metering a block of captured audio.
//
// A device class derives from Aud::Monitor and registers one monitoring
// point per input; a meter builds an Aud::MonitoringPointReader on an
// input's point and polls it. Here a stereo block of 16-bit samples, as a
// device would deliver it, is fed through and read back.
#include <cmath>
#include <cstdio>

#include "tonebits/tonebits.h"

namespace {

class StereoDevice : public Aud::Monitor {
 public:
  StereoDevice() { registerMonitoringPoints(2); }
  virtual ~StereoDevice() {
    for (const IdStamp& writer : inputWriterIds) Aud::MonitoringPointManager::unregisterMP(writer);
  }
  void captured(Aud::StreamBufferList& block) { updateMonitoringPoints(block); }
};

// One channel of 16-bit samples in host memory: a sine of the given peak.
Aud::StreamBuffer sineBlock(unsigned samples, double peak) {
  Aud::StreamBuffer block(0, samples, 1);
  block.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(samples * 2));
  block.valid = true;
  for (unsigned i = 0; i < samples; ++i)
    Aud::sampleFromFloat(1, float(peak * std::sin(i * 0.05)), block.getBuffer() + 2 * i);
  return block;
}

}  // namespace

int main() {
  StereoDevice device;
  Aud::MonitoringPointReader left(device.getInputMonitoringPointId(0));
  Aud::MonitoringPointReader right(device.getInputMonitoringPointId(1));

  Aud::StreamBufferList block;
  block.numSamples = 480;  // 10 ms at 48 kHz
  block.sampleType = 1;    // 16-bit integer
  block.buffers.push_back(sineBlock(480, 0.5));
  block.buffers.push_back(sineBlock(480, 1.0));
  device.captured(block);

  // A resetting read takes the peak and lets the next block replace it.
  const float l = left.peakValue(true), r = right.peakValue(true);
  std::printf("left  %.2f dBFS%s\n", 20 * std::log10(l), left.hasClipped(true) ? "  CLIP" : "");
  std::printf("right %.2f dBFS%s\n", 20 * std::log10(r), right.hasClipped(true) ? "  CLIP" : "");
  return 0;
}
