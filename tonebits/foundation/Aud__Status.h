// The library-wide status code and its classification.
//
// Aud::eStatus is a 32-bit signed value: 0 to 2 are ok, 7 to 44 are
// failures, nothing is a warning. Callers store and pass values outside the
// named ones, so every function here is total over the whole 32-bit range.
#pragma once

#include <cstdint>

#include "tonebits/export.h"

namespace Aud {

enum eStatus : int32_t {
  sSuccess = 0,
  sReady = 1,
  sPending = 2,
  sInvalid = 7,
  sAlreadyReserved = 8,
  sAlreadyInGroup = 9,
  sNotFound = 10,
  sOutOfRange = 11,
  sHardwareNotCapable = 12,
  sSampleRateMismatch = 13,
  sConflictingSampleRate = 14,
  sConflictingIO_SyncSource = 15,
  sConflictingIO_MixerState = 16,
  sConflictingChannelNumber = 17,
  sFailedToSetHardwareSampleRateOrSyncSource = 18,
  sInvalidIO_MixerState = 19,
  sInvalidIO_Direction = 20,
  sInvalidSampleRate = 21,
  sInvalidIO_ConnectionType = 22,
  sInvalidIO_SyncSourceType = 23,
  sInvalidReserverName = 24,
  sChannelNumberOutOfRange = 25,
  sIO_SyncSourceInputNumberOutOfRange = 26,
  sIO_ConnectionTypeNotAvailable = 27,
  sIO_SyncSourceTypeNotSupported = 28,
  sSampleRateNotSupported = 29,
  sUnavailable = 30,
  sInvalidEditType = 31,
  sReadFailed = 32,
  sOutOfNodes = 33,
  sOutOfMemory = 34,
  sIteratorStateMismatch = 35,
  sInvalidChannelNumber = 36,
  sCaptureActive = 37,
  sDeactivationInProgress = 38,
  sAlreadyInUse = 39,
  sEditHasNoAudioChannels = 40,
  sInvalidEdit = 41,
  sRenderingAbortedByCallbackFn = 42,
  sEditIsInvalid = 43,
};

// True for 0, 1 and 2 (tested unsigned: negative values are not ok).
TONEBITS_API bool isOk(eStatus status) noexcept;
// No status is a warning.
TONEBITS_API bool isWarning(eStatus status) noexcept;
// True for 7 to 44 (tested unsigned).
TONEBITS_API bool isFailure(eStatus status) noexcept;
// The enumerator's name for 0 to 2 and 7 to 43, "<UNKNOWN>" otherwise.
TONEBITS_API char const* getDebugString(eStatus status) noexcept;

}  // namespace Aud

// The library's version, "11.1.0.0".
TONEBITS_API char const* tonebitsDllVersionStr() noexcept;
