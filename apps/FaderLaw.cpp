#include "FaderLaw.h"

#include "Cli.h"
#include "tonebits/dsp/Aud__GainCurve.h"

namespace cli {

using namespace Aud::GainCurve;

Law parseLaw(const std::string& name) {
  if (name == "linear") return Law::Linear;
  if (name == "mixer") return Law::Mixer;
  if (name == "power") return Law::Power;
  throw UsageError("unknown fader law '" + name + "' (linear, mixer or power)");
}

const char* lawName(Law law) {
  switch (law) {
    case Law::Linear: return "linear";
    case Law::Mixer: return "mixer";
    case Law::Power: return "power";
  }
  return "?";
}

double maximumFader(Law law) {
  switch (law) {
    case Law::Linear: return Curve<Linear>::maximumUValue();
    case Law::Mixer: return Curve<MixerStyleLog1>::maximumUValue();
    case Law::Power: return Curve<ConstantPower1>::maximumUValue();
  }
  return 1.0;
}

float faderToGain(Law law, double position) {
  if (!(position >= 0.0 && position <= maximumFader(law)))
    throw UsageError("fader position " + std::to_string(position) + " is outside 0 to " +
                     std::to_string(maximumFader(law)) + " on the " + lawName(law) + " law");
  const float u = static_cast<float>(position);
  switch (law) {
    case Law::Linear: return Curve<Linear>::mapUValueToMagnitude(u);
    case Law::Mixer: return Curve<MixerStyleLog1>::mapUValueToMagnitude(u);
    case Law::Power: return Curve<ConstantPower1>::mapUValueToMagnitude(u);
  }
  return 1.0f;
}

float gainToFader(Law law, float gain) {
  switch (law) {
    case Law::Linear: return Curve<Linear>::mapMagnitudeToUValue(gain);
    case Law::Mixer: return Curve<MixerStyleLog1>::mapMagnitudeToUValue(gain);
    case Law::Power: return Curve<ConstantPower1>::mapMagnitudeToUValue(gain);
  }
  return 1.0f;
}

}  // namespace cli
