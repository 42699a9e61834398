// The speed-change factor under which material of one frame rate plays
// naturally in a project of another.
//
// The choice is made by a fixed table of rules over five values: the first
// and second frame rates, the medium the material was shot on, the transfer
// from film to video, and a third frame rate. Rules are tried in order and
// the first that matches all five gives the factor.
//
// When the transfer is unknown (0), the first rate is a film rate (24 or
// film carried at 30/1.001) and the second is a video rate, the transfer is
// taken from the configuration key "video_in_film_pulldown": non-zero means
// pulldown, zero means a speed change. Its default is 0 for the 25 and 50
// frame rates and 1 for the 30, 30/1.001, 60 and 60/1.001 ones; the key is
// read in no other case.
#pragma once

#include "host/MediaTypes.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__SampleRate.h"
#include "tonebits/foundation/Aud__Status.h"

namespace Aud::Util {

// sSuccess with out set by the first matching rule, or sInvalid with out
// unchanged when no rule covers the combination.
TONEBITS_API eStatus determineNaturalPlaybackResamplingFactor(eFactor& out, Kv::FrameRate first,
                                                              Kv::FrameRate second, MediumRollMedium medium,
                                                              transfer_type transfer, Kv::FrameRate third);

}  // namespace Aud::Util
