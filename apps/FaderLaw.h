// The fader laws by name, over the library's gain curves.
#pragma once

#include <string>

namespace cli {

enum class Law { Linear = 1, Mixer = 2, Power = 3 };

Law parseLaw(const std::string& name);
const char* lawName(Law law);
// The gain of a fader position; throws UsageError outside the law's range.
float faderToGain(Law law, double position);
float gainToFader(Law law, float gain);
double maximumFader(Law law);

}  // namespace cli
