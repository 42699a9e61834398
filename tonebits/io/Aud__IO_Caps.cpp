#include "tonebits/io/Aud__IO_Caps.h"

#include <cstdio>

#include "host/Log.h"
#include "host/Resources.h"

namespace Aud {

namespace {
constexpr int kInvalidText = 56;
}  // namespace

WString getDisplayString(eIO_ConnectionType type) {
  switch (type) {
    case ctAnalogue: return resourceStrW(2075, 0);
    case ctAES_EBU: return resourceStrW(2078, 0);
    case ct1394: return WString(L"1394");
    case ctADAT: return resourceStrW(2080, 0);
    case ctSPDIF: return resourceStrW(2079, 0);
    case ctSDI: return resourceStrW(2081, 0);
    case ctHDMI: return WString(L"HDMI");
    default: return resourceStrW(kInvalidText, 0);
  }
}

WString getDisplayString(eIO_SyncSourceType type) {
  switch (type) {
    case ssFreeRunning: return WString(L"Free Running");
    case ssVideo: return WString(L"Video");
    case ssLTC: return WString(L"LTC");
    case ssAES_EBU: return WString(L"AES/EBU");
    default: vel_splat("Dodgy enum!"); return WString();
  }
}

// ---------------------------------------------------------------------------

const IO_ConnectionTypeInfo::Rep* IO_ConnectionTypeInfo::checked() const {
  if (!rep_) vel_splat("Method called on invalid IO_ConnectionTypeInfo object");
  return rep_;
}

bool IO_ConnectionTypeInfo::supportsGainControl() const {
  const Rep* rep = checked();
  return rep && rep->gainControl;
}

double IO_ConnectionTypeInfo::mininumGain() const {
  const Rep* rep = checked();
  return rep ? rep->minGain : 0.0;
}

double IO_ConnectionTypeInfo::maximumGain() const {
  const Rep* rep = checked();
  return rep ? rep->maxGain : 0.0;
}

bool IO_ConnectionTypeInfo::supportsSRC() const {
  const Rep* rep = checked();
  return rep && rep->src;
}

eIO_ConnectionClass IO_ConnectionTypeInfo::getConnectionClass() const {
  const Rep* rep = checked();
  return rep ? rep->connectionClass : eIO_ConnectionClass(0);
}

bool IO_ConnectionTypeInfo::isAnalogue() const { return getConnectionClass() == ccAnalogue; }
bool IO_ConnectionTypeInfo::isDigital() const { return getConnectionClass() == ccDigital; }
bool IO_ConnectionTypeInfo::isMixer() const { return getConnectionClass() == ccMixer; }

eIO_ConnectionType IO_ConnectionTypeInfo::type() const noexcept {
  return rep_ ? rep_->connectionType : ctNone;
}

bool IO_ConnectionTypeInfo::supportsSRC(const SampleRate& reference, const SampleRate& rate) const {
  const Rep* rep = checked();
  if (!rep) return false;
  if (rep->connectionClass != ccDigital) return true;
  if (!rep->src) return false;
  const double r = reference.calcCombinedSampleRate();
  const double x = rate.calcCombinedSampleRate();
  if (rep->absoluteSRCRange) return rep->srcLowerBound <= x && x <= rep->srcUpperBound;
  return r - r * rep->srcLowerBound <= x && x <= r * rep->srcUpperBound + r;
}

WString IO_ConnectionTypeInfo::getDisplayString() const {
  checked();
  return Aud::getDisplayString(type());
}

WString IO_ConnectionTypeInfo::getSRCDisplayString() const {
  const Rep* rep = checked();
  return rep ? Kv::WStringFromAscii(rep->srcDisplayText) : WString();
}

// ---------------------------------------------------------------------------

unsigned int IO_SyncSourceTypeInfo::numInputs() const {
  if (!rep_) {
    vel_splat("Method called on invalid IO_SyncSourceTypeInfo object");
    return 0;
  }
  return rep_->numInputs;
}

eIO_SyncSourceType IO_SyncSourceTypeInfo::type() const noexcept { return rep_ ? rep_->type : ssNone; }

// ---------------------------------------------------------------------------

IO_SyncSource::IO_SyncSource() : IO_SyncSource(ssNone, kNoInput) {}

IO_SyncSource::IO_SyncSource(eIO_SyncSourceType type, unsigned int inputNumber) : record_(new Record) {
  record_->type = type;
  record_->inputNumber = inputNumber;
}

IO_SyncSource::IO_SyncSource(const IO_SyncSource& other) : IO_SyncSource(other.type(), other.inputNumber()) {}

IO_SyncSource& IO_SyncSource::operator=(const IO_SyncSource& other) noexcept {
  *record_ = *other.record_;
  return *this;
}

IO_SyncSource::~IO_SyncSource() = default;

eStatus IO_SyncSource::type(eIO_SyncSourceType type) noexcept {
  record_->type = type;
  return sSuccess;
}

eStatus IO_SyncSource::inputNumber(unsigned int inputNumber) noexcept {
  record_->inputNumber = inputNumber;
  return sSuccess;
}

void IO_SyncSource::reset() noexcept {
  record_->type = ssNone;
  record_->inputNumber = kNoInput;
}

bool IO_SyncSource::operator==(const IO_SyncSource& other) const noexcept {
  return type() == other.type() && inputNumber() == other.inputNumber();
}

WString IO_SyncSource::getDisplayString() const {
  WString text = Aud::getDisplayString(type());
  if (type() == ssAES_EBU) {
    text += inputNumber() == 0 ? L" 1&2" : L" 3&4";
  } else {
    // Unsigned throughout: the input after 0x7FFFFFFF must not read as a
    // negative number, and kNoInput wraps to 0 as "no input".
    char digits[16];
    std::snprintf(digits, sizeof(digits), " %u", inputNumber() + 1u);
    text += Kv::WStringFromAscii(digits);
  }
  return text;
}

}  // namespace Aud

template class std::vector<Aud::IO_ConnectionTypeInfo, StdAllocator<Aud::IO_ConnectionTypeInfo>>;
template class std::vector<Aud::IO_SyncSourceTypeInfo, StdAllocator<Aud::IO_SyncSourceTypeInfo>>;
namespace Aud {
template class AudCapsVector<IO_ConnectionTypeInfo, eIO_ConnectionType>;
template class AudCapsVector<IO_SyncSourceTypeInfo, eIO_SyncSourceType>;
}  // namespace Aud
