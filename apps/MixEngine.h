// Mixes blocks of planar inputs to the physical outputs a mixer state
// describes: input faders (on the mixer fader law), constant-power pans,
// mutes and solos, input-to-mix routing, mix faders and switches, and the
// mix sides routed to each physical output.
#pragma once

#include <vector>

#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace cli {

class MixEngine {
 public:
  // Takes the state's settings as they are now.
  MixEngine(Aud::SimpleMixState& state, int inputs, int mixRows, int outputs);
  // outputs[o] = the mix of inputs[i] over 4 x quads samples; every buffer
  // holds at least that many.
  void process(float* const* inputs, float* const* outputs, unsigned quads);
  int outputs() const { return outputs_; }

 private:
  int inputs_, mixRows_, outputs_;
  std::vector<float> gainL_, gainR_, mixGain_;
  std::vector<std::vector<int>> inputRows_;                    // mix rows each input feeds
  std::vector<std::vector<std::pair<int, int>>> outputFeeds_;  // (row, side) feeding each output
  std::vector<float> buses_;
  unsigned busQuads_ = 0;
};

}  // namespace cli
