#include "tonebits/foundation/Aud__Status.h"

namespace Aud {

namespace {
constexpr const char* kNames[] = {
    "sSuccess",
    "sReady",
    "sPending",
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    "sInvalid",
    "sAlreadyReserved",
    "sAlreadyInGroup",
    "sNotFound",
    "sOutOfRange",
    "sHardwareNotCapable",
    "sSampleRateMismatch",
    "sConflictingSampleRate",
    "sConflictingIO_SyncSource",
    "sConflictingIO_MixerState",
    "sConflictingChannelNumber",
    "sFailedToSetHardwareSampleRateOrSyncSource",
    "sInvalidIO_MixerState",
    "sInvalidIO_Direction",
    "sInvalidSampleRate",
    "sInvalidIO_ConnectionType",
    "sInvalidIO_SyncSourceType",
    "sInvalidReserverName",
    "sChannelNumberOutOfRange",
    "sIO_SyncSourceInputNumberOutOfRange",
    "sIO_ConnectionTypeNotAvailable",
    "sIO_SyncSourceTypeNotSupported",
    "sSampleRateNotSupported",
    "sUnavailable",
    "sInvalidEditType",
    "sReadFailed",
    "sOutOfNodes",
    "sOutOfMemory",
    "sIteratorStateMismatch",
    "sInvalidChannelNumber",
    "sCaptureActive",
    "sDeactivationInProgress",
    "sAlreadyInUse",
    "sEditHasNoAudioChannels",
    "sInvalidEdit",
    "sRenderingAbortedByCallbackFn",
    "sEditIsInvalid",
};
static_assert(sizeof(kNames) / sizeof(kNames[0]) == 44);
}  // namespace

bool isOk(eStatus status) noexcept { return static_cast<uint32_t>(status) <= 2u; }
// The warning range lies strictly between 4 and 5: it holds no value.
bool isWarning(eStatus) noexcept { return false; }
bool isFailure(eStatus status) noexcept { return static_cast<uint32_t>(status) - 7u <= 37u; }

char const* getDebugString(eStatus status) noexcept {
  const uint32_t index = static_cast<uint32_t>(status);
  if (index < 44u && kNames[index]) return kNames[index];
  return "<UNKNOWN>";
}

}  // namespace Aud

char const* tonebitsDllVersionStr() noexcept { return "11.1.0.0"; }
