// The host's media descriptions that audio timing is chosen by: the video
// frame rate of material and projects, the medium material was shot on and
// how film was transferred to video. Values are fixed by the host's stored
// projects; callers may pass values no enumerator names.
#pragma once

#include <cstdint>

namespace Kv {

enum FrameRate : int32_t {
  frUnknown = 0,
  fr24 = 1,
  fr23_976 = 2,  // 24/1.001
  fr25 = 3,
  fr30 = 4,
  fr29_97 = 5,          // 30/1.001
  fr29_97FromFilm = 6,  // 30/1.001, film material carried at the video rate
  fr47_952 = 7,         // 48/1.001
  fr50 = 8,
  fr60 = 9,
  fr59_94 = 10,  // 60/1.001
};

}  // namespace Kv

enum MediumRollMedium : int32_t {
  rmUnknown = 0,
  rmFilm = 2,
  rmVideo = 3,
};

enum transfer_type : int32_t {
  ttUnknown = 0,
  ttSpeedChange = 3,  // film run at the video frame rate
  ttPulldown = 7,     // film frames repeated to fill the video frame rate
};
