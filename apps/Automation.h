// Level automation read from a text file into the library's level store.
//
// One node a line: TIME LEVEL, time in seconds and level as a linear gain or
// in decibels with a dB suffix ("2.5 0.5", "3 -6dB"). Blank lines and lines
// starting with # are skipped; anything else is an error naming the line.
#pragma once

#include <memory>
#include <string>

#include "tonebits/levels/Aud__DynamicLevelControl.h"

namespace cli {

std::unique_ptr<Aud::DynamicLevelControl::Store> readAutomation(const std::string& path);

}  // namespace cli
