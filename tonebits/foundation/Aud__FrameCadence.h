// Audio samples per video frame and per video field, as one cycle of a
// repeating cadence.
//
// Each frame rate has a base cadence at 48 kHz, 44.1 kHz and 32 kHz (the
// 30/1.001 family has the long cadences of 5, 100 and 15 frames that sum to
// 8008, 147147 and 16016 samples). Other rates are derived from these: 11.025
// and 22.05 kHz scale the 44.1 kHz cadence by 1/4 and 1/2, 96 kHz doubles the
// 48 kHz one, and a rate with speed-change factors walks the base cadence
// scaling each entry and carrying the rounding, until the walk returns to
// the cycle start with nothing carried, or until about 108000 entries, when
// the last entry of a cycle absorbs the carry and the cycle is closed. Every
// entry stays within a sample of its exact share.
//
// A base that derives from none of 32, 44.1 and 48 kHz (srNone, srProject,
// 16 and 24 kHz) is a broken invariant: it is reported through vel_splat with
// "Not implemented for this rate!" and gives an empty cadence.
#pragma once

#include <vector>

#include "host/MediaTypes.h"
#include "host/OS.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__SampleRate.h"

namespace Aud::Util {

using SampleCounts = std::vector<unsigned int, StdAllocator<unsigned int>>;

// Samples per video frame, one cycle of the cadence. Empty for a frame rate
// whose cadence exists only at 48 kHz when the rate derives from another.
TONEBITS_API SampleCounts getSMPTE_FrameSequence(SampleRate const& rate, Kv::FrameRate frameRate);

// Samples per video field: each frame's n samples as n / 2 then n - n / 2.
TONEBITS_API SampleCounts getSMPTE_FieldSequence(SampleRate const& rate, Kv::FrameRate frameRate);

}  // namespace Aud::Util
