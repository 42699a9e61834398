#include "FrameRates.h"

#include "Cli.h"

namespace cli {

const FrameRateName& parseFrameRate(const std::string& text) {
  static const FrameRateName kRates[] = {
      {"23.976", Kv::fr23_976, 24000.0 / 1001},
      {"24", Kv::fr24, 24},
      {"25", Kv::fr25, 25},
      {"29.97", Kv::fr29_97, 30000.0 / 1001},
      {"30", Kv::fr30, 30},
      {"47.952", Kv::fr47_952, 48000.0 / 1001},
      {"50", Kv::fr50, 50},
      {"59.94", Kv::fr59_94, 60000.0 / 1001},
      {"60", Kv::fr60, 60},
  };
  for (const FrameRateName& r : kRates)
    if (text == r.name) return r;
  throw UsageError("unknown frame rate '" + text + "' (23.976 24 25 29.97 30 47.952 50 59.94 60)");
}

}  // namespace cli
