// The input monitor: one monitoring point per physical input of an audio
// device, fed from each captured block.
//
// A device class derives from Aud::Monitor, calls registerMonitoringPoints
// once with its number of inputs, and calls updateMonitoringPoints with every
// block it captures, in whatever sample form the block holds. Meters take
// input i's point id from getInputMonitoringPointId and build readers on it.
//
// Per block, buffer i feeds input i (extra buffers are not read; inputs
// without a buffer get no write): its samples are decoded by the block's
// sample type, the peak is the largest magnitude (NaNs passed over, 0 for no
// samples), a peak above 0.99 is reported as a clip first, and the peak is
// written. A block of an unsupported sample type logs once per buffer and
// writes a peak of 0. A buffer without memory writes a peak of 0, and only
// the samples its memory holds are read.
//
// The monitor owns only the ids: destroying it leaves its points registered
// and their readers attached. One monitor is used by one thread at a time.
#pragma once

#include <vector>

#include "host/IdStamp.h"
#include "host/OS.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"

namespace Aud {

class TONEBITS_API Monitor {
 public:
  Monitor();
  // Copies name the same points; nothing is registered.
  Monitor(Monitor const& other);
  Monitor& operator=(Monitor const& other);

  // The point id of an input, or the invalid id past the registered inputs.
  virtual IdStamp const& getInputMonitoringPointId(unsigned int input);

 protected:
  // Not virtual, so not public: a monitor is destroyed as the device class
  // that derives from it, never through a pointer to this base.
  ~Monitor();

  // Registers inputCount more points, named "[ZIREzuru][PhysicalInput][i]"
  // with i counting from 0 on every call.
  void registerMonitoringPoints(unsigned int inputCount);
  // Feeds one block; an empty block makes no manager call.
  void updateMonitoringPoints(StreamBufferList& block);

  // Element i of both belongs to input i. The device keeps the points alive
  // after the monitor goes, so it may read the writer ids to unregister them.
  std::vector<IdStamp, StdAllocator<IdStamp>> inputPointIds;
  std::vector<IdStamp, StdAllocator<IdStamp>> inputWriterIds;
};

}  // namespace Aud
