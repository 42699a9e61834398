#include "MixEngine.h"

#include <algorithm>
#include <cmath>

#include "tonebits/dsp/Aud__GainCurve.h"
#include "tonebits/dsp/Aud__MixRender.h"

namespace cli {

using Aud::GainCurve::Curve;
using Aud::GainCurve::MixerStyleLog1;

MixEngine::MixEngine(Aud::SimpleMixState& state, int inputs, int mixRows, int outputs)
    : inputs_(inputs),
      mixRows_(mixRows),
      outputs_(outputs),
      gainL_(inputs),
      gainR_(inputs),
      mixGain_(mixRows),
      inputRows_(inputs),
      outputFeeds_(outputs) {
  bool anyInputSolo = false, anyMixSolo = false;
  for (int i = 0; i < inputs; ++i) anyInputSolo |= state.getInputSoloState(i);
  for (int m = 0; m < mixRows - 1; ++m) anyMixSolo |= state.getMixSoloState(m);
  for (int i = 0; i < inputs; ++i) {
    const bool audible = !state.getInputMuteState(i) && (!anyInputSolo || state.getInputSoloState(i));
    const float gain = audible ? Curve<MixerStyleLog1>::mapUValueToMagnitude(state.getInputLevel(i)) : 0.0f;
    // Pan 0 is hard left, 0.5 the centre (-3 dB each side), 1 hard right:
    // a quarter turn of the library's sine and cosine.
    const float pan = std::clamp(state.getInputPan(i), 0.0f, 1.0f);
    float sine = 0, cosine = 0;
    Aud::MixRender::fastSineCosine(sine, cosine, static_cast<unsigned>(std::lround(pan * 16384.0f)));
    gainL_[i] = gain * cosine;
    gainR_[i] = gain * sine;
    for (int r = 0; r < mixRows; ++r)
      if (state.getInputRoutedToMix(i, r - 1)) inputRows_[i].push_back(r);
  }
  for (int r = 0; r < mixRows; ++r) {
    const bool audible =
        !state.getMixMuteState(r - 1) && (r == 0 || !anyMixSolo || state.getMixSoloState(r - 1));
    mixGain_[r] = audible ? Curve<MixerStyleLog1>::mapUValueToMagnitude(state.getMixLevel(r - 1)) : 0.0f;
    for (int o = 0; o < outputs; ++o)
      for (int side = 0; side < 2; ++side)
        if (state.getMixRoutedToOutput(r - 1, o, side == 0)) outputFeeds_[o].emplace_back(r, side);
  }
}

void MixEngine::process(float* const* inputs, float* const* outputs, unsigned quads) {
  if (busQuads_ < quads) {
    buses_.assign(std::size_t(mixRows_) * 2 * quads * 4, 0.0f);
    busQuads_ = quads;
  }
  auto bus = [&](int row, int side) { return buses_.data() + (std::size_t(row) * 2 + side) * busQuads_ * 4; };
  for (int r = 0; r < mixRows_; ++r)
    for (int side = 0; side < 2; ++side) std::fill(bus(r, side), bus(r, side) + quads * 4, 0.0f);
  for (int i = 0; i < inputs_; ++i)
    for (int r : inputRows_[i])
      Aud::MixRender::MultiplyConstantAndAdd2(inputs[i], bus(r, 0), bus(r, 1), quads, gainL_[i], gainR_[i]);
  for (int o = 0; o < outputs_; ++o) {
    std::fill(outputs[o], outputs[o] + quads * 4, 0.0f);
    for (const auto& [r, side] : outputFeeds_[o])
      Aud::MixRender::MultiplyConstantAndAdd(bus(r, side), outputs[o], quads, mixGain_[r]);
  }
}

}  // namespace cli
