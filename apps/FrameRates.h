// Video frame rates by the names users give them.
#pragma once

#include <string>

#include "host/MediaTypes.h"

namespace cli {

struct FrameRateName {
  const char* name;
  Kv::FrameRate rate;
  double fps;
};

const FrameRateName& parseFrameRate(const std::string& text);

}  // namespace cli
