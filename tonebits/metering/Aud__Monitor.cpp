#include "tonebits/metering/Aud__Monitor.h"

#include <algorithm>
#include <cstdio>

#include "host/Log.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/metering/Aud__MonitoringPointManager.h"
#include "tonebits/metering/Aud__SamplePeak.h"

namespace Aud {

namespace {
// A peak above this (compared in double) is reported as a clip.
constexpr double kClipThreshold = 0.99;
}  // namespace

Monitor::Monitor() = default;
Monitor::Monitor(Monitor const& other) = default;
Monitor& Monitor::operator=(Monitor const& other) = default;
Monitor::~Monitor() = default;

IdStamp const& Monitor::getInputMonitoringPointId(unsigned int input) {
  return input < inputPointIds.size() ? inputPointIds[input] : Private::invalidIdStamp();
}

void Monitor::registerMonitoringPoints(unsigned int inputCount) {
  // Room first, so a point is never registered without being recorded.
  inputPointIds.reserve(inputPointIds.size() + inputCount);
  inputWriterIds.reserve(inputWriterIds.size() + inputCount);
  for (unsigned int i = 0; i < inputCount; ++i) {
    char name[48];
    std::snprintf(name, sizeof name, "[ZIREzuru][PhysicalInput][%d]", static_cast<int>(i));
    MonitoringPointInfo info;
    info.code = 0;
    info.text1 = name;
    info.text2 = name;
    info.text3 = name;
    info.flag = true;
    info.value = 60.0f;
    IdStamp pointId, writerId;
    MonitoringPointManager::registerMP(info, pointId, writerId);
    inputPointIds.push_back(pointId);
    inputWriterIds.push_back(writerId);
  }
}

void Monitor::updateMonitoringPoints(StreamBufferList& block) {
  const std::size_t inputs = std::min(block.buffers.size(), inputWriterIds.size());
  if (inputs == 0) return;
  MonitoringPointManager& manager = MonitoringPointManager::instance();
  const int sampleType = block.sampleType;
  const unsigned bytesPerSample = bytesPerSampleOfType(sampleType);
  for (std::size_t i = 0; i < inputs; ++i) {
    float peak = 0.0f;
    if (bytesPerSample == 0) {
      LogBoth("Monitor: buffer sample format not supported!");
    } else {
      const StreamBuffer& buffer = block.buffers[i];
      if (const unsigned char* samples = buffer.getBuffer()) {
        const std::size_t held = buffer.getBufferSize() / bytesPerSample;
        peak = Private::samplePeak(sampleType, samples, std::min<std::size_t>(block.numSamples, held));
      }
    }
    // The clip first: it raises the held peak to full scale, so the peak
    // written after it leaves a clipped meter at 1.0 or above.
    if (static_cast<double>(peak) > kClipThreshold) manager.mpUpdateHasClipped(inputWriterIds[i]);
    manager.mpUpdatePeakSampleValue(inputWriterIds[i], peak);
  }
}

}  // namespace Aud
