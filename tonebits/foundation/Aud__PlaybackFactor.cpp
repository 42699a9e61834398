#include "tonebits/foundation/Aud__PlaybackFactor.h"

#include <cstdint>

#include "host/Config.h"

namespace Aud::Util {

namespace {

// Each cell is a set of values held as a mask; 0 matches any value, even one
// that belongs to no set.
enum FrameRateSet : uint32_t {
  kFilm = 0x1,      // 24, 24/1.001
  kPal = 0x2,       // 25
  kNtsc = 0x4,      // 30, 30/1.001
  kFilmIn30 = 0x8,  // film carried at 30/1.001
  kPal50 = 0x10,    // 50
  kNtsc60 = 0x20,   // 60, 60/1.001
};
enum MediumSet : uint32_t { kMediumFilm = 0x1, kMediumVideo = 0x2 };
enum TransferSet : uint32_t { kTransferNone = 0x1, kTransferPulldown = 0x2, kTransferSpeedChange = 0x4 };
constexpr uint32_t kAny = 0;
constexpr uint32_t k25 = kPal | kPal50;
constexpr uint32_t k30 = kNtsc | kNtsc60;

struct Rule {
  uint32_t first, second, medium, transfer, third;
  eFactor factor;
};

constexpr eFactor k24_30x1001 = fx24_30 | fx1001;

// clang-format off
constexpr Rule kRules[] = {
    {k25,       kFilm, kAny,         kAny,                 kFilm,     fNone},
    {k25,       k25,   kAny,         kTransferNone,        kAny,      fNone},
    {k25,       k25,   kAny,         kTransferPulldown,    kFilm,     fNone},
    {k25,       k25,   kAny,         kTransferSpeedChange, kFilm,     fx24_25},
    {k25,       k25,   kAny,         kTransferSpeedChange, kPal,      fNone},
    {k25,       k25,   kAny,         kTransferPulldown,    kFilmIn30, fNone},
    {k25,       k25,   kAny,         kTransferSpeedChange, kFilmIn30, fx24_25},
    {k25,       kFilm, kAny,         kAny,                 kFilmIn30, fNone},
    {k30,       kFilm, kMediumVideo, kAny,                 kFilm,     fx1001},
    {k30,       kFilm, kMediumFilm,  kAny,                 kFilm,     fNone},
    {k30,       k30,   kAny,         kTransferNone,        kAny,      fNone},
    {k30,       k30,   kMediumVideo, kTransferPulldown,    kFilm,     fx1001},
    {k30,       k30,   kMediumFilm,  kTransferPulldown,    kFilm,     fNone},
    {k30,       k30,   kMediumVideo, kTransferSpeedChange, kFilm,     k24_30x1001},
    {k30,       k30,   kMediumFilm,  kTransferSpeedChange, kFilm,     fx24_30},
    {k30,       k30,   kMediumVideo, kTransferSpeedChange, kNtsc,     fx1001},
    {k30,       k30,   kMediumFilm,  kTransferSpeedChange, kNtsc,     fNone},
    {k30,       k30,   kMediumVideo, kTransferPulldown,    kFilmIn30, fx1001},
    {k30,       k30,   kMediumFilm,  kTransferPulldown,    kFilmIn30, fNone},
    {k30,       k30,   kMediumVideo, kTransferSpeedChange, kFilmIn30, k24_30x1001},
    {k30,       k30,   kMediumFilm,  kTransferSpeedChange, kFilmIn30, fx24_30},
    {k30,       kFilm, kMediumVideo, kAny,                 kFilmIn30, fx1001},
    {k30,       kFilm, kMediumFilm,  kAny,                 kFilmIn30, fNone},
    {kFilm,     kFilm, kMediumVideo, kAny,                 kFilm,     fx1001},
    {kFilm,     kFilm, kMediumFilm,  kAny,                 kFilm,     fNone},
    {kFilm,     k25,   kAny,         kTransferPulldown,    kFilm,     fNone},
    {kFilm,     k25,   kAny,         kTransferSpeedChange, kFilm,     fx24_25},
    {kFilm,     k30,   kMediumVideo, kTransferPulldown,    kFilm,     fx1001},
    {kFilm,     k30,   kMediumFilm,  kTransferPulldown,    kFilm,     fNone},
    {kFilm,     k30,   kMediumVideo, kTransferSpeedChange, kFilm,     k24_30x1001},
    {kFilm,     k30,   kMediumFilm,  kTransferSpeedChange, kFilm,     fx24_30},
    {kFilmIn30, kFilm, kMediumVideo, kAny,                 kFilmIn30, fx1001},
    {kFilmIn30, kFilm, kMediumFilm,  kAny,                 kFilmIn30, fNone},
    {kFilmIn30, k25,   kAny,         kTransferPulldown,    kFilmIn30, fNone},
    {kFilmIn30, k25,   kAny,         kTransferSpeedChange, kFilmIn30, fx24_25},
    {kFilmIn30, k30,   kMediumVideo, kTransferPulldown,    kFilmIn30, fx1001},
    {kFilmIn30, k30,   kMediumFilm,  kTransferPulldown,    kFilmIn30, fNone},
    {kFilmIn30, k30,   kMediumVideo, kTransferSpeedChange, kFilmIn30, k24_30x1001},
    {kFilmIn30, k30,   kMediumFilm,  kTransferSpeedChange, kFilmIn30, fx24_30},
};
// clang-format on
static_assert(sizeof(kRules) / sizeof(kRules[0]) == 39);

// The set bit of a value; 0 for a value in no set (48/1.001 and anything
// outside 1 to 10), which then matches only an "any" cell.
uint32_t frameRateBit(Kv::FrameRate rate) noexcept {
  switch (rate) {
    case Kv::fr24:
    case Kv::fr23_976: return kFilm;
    case Kv::fr25: return kPal;
    case Kv::fr30:
    case Kv::fr29_97: return kNtsc;
    case Kv::fr29_97FromFilm: return kFilmIn30;
    case Kv::fr50: return kPal50;
    case Kv::fr60:
    case Kv::fr59_94: return kNtsc60;
    default: return 0;
  }
}

uint32_t mediumBit(MediumRollMedium medium) noexcept {
  return medium == rmFilm ? kMediumFilm : medium == rmVideo ? kMediumVideo : 0u;
}

uint32_t transferBit(transfer_type transfer) noexcept {
  switch (transfer) {
    case ttUnknown: return kTransferNone;
    case ttPulldown: return kTransferPulldown;
    case ttSpeedChange: return kTransferSpeedChange;
    default: return 0;
  }
}

bool cellMatches(uint32_t cell, uint32_t bit) noexcept { return cell == kAny || (cell & bit) != 0; }

transfer_type defaultTransfer(Kv::FrameRate first, Kv::FrameRate second, transfer_type transfer) {
  if (transfer != ttUnknown || (first != Kv::fr24 && first != Kv::fr29_97FromFilm)) return transfer;
  switch (second) {
    case Kv::fr25:
    case Kv::fr50: return config_int("video_in_film_pulldown", 0) != 0 ? ttPulldown : ttSpeedChange;
    case Kv::fr30:
    case Kv::fr29_97:
    case Kv::fr60:
    case Kv::fr59_94: return config_int("video_in_film_pulldown", 1) != 0 ? ttPulldown : ttSpeedChange;
    default: return transfer;
  }
}

}  // namespace

eStatus determineNaturalPlaybackResamplingFactor(eFactor& out, Kv::FrameRate first, Kv::FrameRate second,
                                                 MediumRollMedium medium, transfer_type transfer,
                                                 Kv::FrameRate third) {
  transfer = defaultTransfer(first, second, transfer);
  const uint32_t firstBit = frameRateBit(first), secondBit = frameRateBit(second),
                 thirdBit = frameRateBit(third);
  const uint32_t mediumValue = mediumBit(medium), transferValue = transferBit(transfer);
  for (const Rule& rule : kRules) {
    if (cellMatches(rule.first, firstBit) && cellMatches(rule.second, secondBit) &&
        cellMatches(rule.medium, mediumValue) && cellMatches(rule.transfer, transferValue) &&
        cellMatches(rule.third, thirdBit)) {
      out = rule.factor;
      return sSuccess;
    }
  }
  return sInvalid;
}

}  // namespace Aud::Util
