#include "tonebits/mixer/Aud__SimpleMixState.h"

#include <algorithm>
#include <cstddef>
#include <mutex>

#include "host/Log.h"

namespace Aud {

namespace {

constexpr SimpleMixState::InputChannel kDefaultInput{1.0f, 0.5f, false, false};
constexpr SimpleMixState::MixChannel kDefaultMix{1.0f, false, false};

float clampLevel(float v) noexcept {
  if (v > 1.5f) return 1.5f;
  if (v < 0.0f) return 0.0f;
  return v;  // NaN included
}

int notNegative(int count) noexcept { return count < 0 ? 0 : count; }

}  // namespace

// --- Construction, copying, destruction ---

SimpleMixState::SimpleMixState() = default;

SimpleMixState::SimpleMixState(int inputs, int mixes, int outputs) {
  // The user's counts of further mixes and physical outputs; a negative one
  // counts as none, so the main mix and the pseudo outputs always exist.
  init(notNegative(inputs), notNegative(mixes) + 1, notNegative(outputs) + 2);
}

SimpleMixState::SimpleMixState(const SimpleMixState& other) : Taggable(other) {
  CriticalSectionLock hold(other.lock);
  revisionMajor_ = other.revisionMajor_;
  revisionMinor_ = other.revisionMinor_;
  numInputs = other.numInputs;
  numMixes = other.numMixes;
  numOutputs = other.numOutputs;
  inputChannels = other.inputChannels;
  mixChannels = other.mixChannels;
  inputToMixRouting = other.inputToMixRouting;
  mixToOutputRouting = other.mixToOutputRouting;
  valid_ = other.valid_;
  dirty = other.dirty;
}

SimpleMixState::SimpleMixState(Streamable::BuilderType type) : Taggable(type) {}

SimpleMixState::SimpleMixState(Streamable::BuilderType type, const SimpleMixState& original)
    : Taggable(type, original) {
  revisionMajor_ = original.revisionMajor_;
  revisionMinor_ = original.revisionMinor_;
}

SimpleMixState::~SimpleMixState() = default;

SimpleMixState& SimpleMixState::operator=(SimpleMixState& source) {
  copyFrom(source, false);
  return *this;
}

Taggable* SimpleMixState::clone() {
  auto* copy = new SimpleMixState();
  copy->copyFrom(*this, false);
  return copy;
}

Streamable* SimpleMixState::clone(Streamable::BuilderType) {
  return new SimpleMixState(eBuildForClone, *this);
}

void SimpleMixState::init(int inputs, int mixes, int outputs) {
  numInputs = notNegative(inputs);
  numMixes = notNegative(mixes);
  numOutputs = notNegative(outputs);
  const std::size_t ni = static_cast<std::size_t>(numInputs);
  const std::size_t nm = static_cast<std::size_t>(numMixes);
  const std::size_t no = static_cast<std::size_t>(numOutputs);
  inputChannels.assign(ni, kDefaultInput);
  mixChannels.assign(nm, kDefaultMix);
  ByteTable(nm * ni, 0).swap(inputToMixRouting);
  ByteTable(nm * no * 2, 0).swap(mixToOutputRouting);
  valid_ = true;
  resetToDefaultConfiguration(false);
}

void SimpleMixState::copyFrom(SimpleMixState& source, bool takeOverDirty) {
  if (!valid_) {
    if (!source.valid_) return;
    init(source.numInputs, source.numMixes, source.numOutputs);
  }
  // An invalid source has no tables to copy from, whatever its counts say.
  if (&source == this || !source.valid_) return;

  // Both locks at once: two threads copying two states into each other
  // would deadlock taking them one after the other.
  std::scoped_lock both(lock, source.lock);

  const bool thisLarger =
      numInputs > source.numInputs || numMixes > source.numMixes || numOutputs > source.numOutputs;
  const int ni = std::max(numInputs, source.numInputs);
  const int nm = std::max(numMixes, source.numMixes);
  const int no = std::max(numOutputs, source.numOutputs);
  const bool inputRoutingGrew = ni != numInputs || nm != numMixes;
  const bool outputRoutingGrew = nm != numMixes || no != numOutputs;
  numInputs = ni;
  numMixes = nm;
  numOutputs = no;
  inputChannels.resize(static_cast<std::size_t>(ni), kDefaultInput);
  mixChannels.resize(static_cast<std::size_t>(nm), kDefaultMix);
  if (inputRoutingGrew) ByteTable(static_cast<std::size_t>(nm) * ni, 0).swap(inputToMixRouting);
  if (outputRoutingGrew) ByteTable(static_cast<std::size_t>(nm) * no * 2, 0).swap(mixToOutputRouting);
  if (thisLarger) resetToDefaultConfiguration(false);

  const int si = source.numInputs, sm = source.numMixes, so = source.numOutputs;
  std::copy_n(source.inputChannels.begin(), si, inputChannels.begin());
  std::copy_n(source.mixChannels.begin(), sm, mixChannels.begin());
  for (int i = 0; i < si; ++i) {
    std::copy_n(source.inputToMixRouting.begin() + static_cast<std::ptrdiff_t>(i) * sm, sm,
                inputToMixRouting.begin() + static_cast<std::ptrdiff_t>(i) * nm);
  }
  for (int r = 0; r < sm; ++r) {
    std::copy_n(source.mixToOutputRouting.begin() + static_cast<std::ptrdiff_t>(r) * so * 2, so * 2,
                mixToOutputRouting.begin() + static_cast<std::ptrdiff_t>(r) * no * 2);
  }
  dirty = source.dirty;
  if (takeOverDirty) source.dirty = false;
}

// --- Validity, sizes and entry finders ---

bool SimpleMixState::checkValid() const {
  if (valid_) return true;
  vel_splat("Function called on invalid MixerState!");
  return false;
}

uint32_t SimpleMixState::sizeOf(eTables table) const noexcept {
  const uint32_t ni = static_cast<uint32_t>(numInputs);
  const uint32_t nm = static_cast<uint32_t>(numMixes);
  const uint32_t no = static_cast<uint32_t>(numOutputs);
  switch (table) {
    case eInputLevels:
    case eInputPans: return ni * 4;
    case eInputMutes:
    case eInputSolos: return ni;
    case eMixLevels: return nm * 4;
    case eMixMutes:
    case eMixSolos: return nm;
    case eInputToMixRouting: return nm * ni;
    case eMixToOutputRouting: return no * nm * 2;
  }
  return 0;
}

// The finders also check the tables themselves, which a failed unpack may
// have released while the counts stayed.
float* SimpleMixState::ptrInputLevel(int i) {
  return i >= 0 && i < numInputs && static_cast<std::size_t>(i) < inputChannels.size()
             ? &inputChannels[i].level
             : nullptr;
}
float* SimpleMixState::ptrInputPan(int i) {
  float* level = ptrInputLevel(i);
  return level ? &inputChannels[i].pan : nullptr;
}
bool* SimpleMixState::ptrInputMuteState(int i) { return ptrInputLevel(i) ? &inputChannels[i].mute : nullptr; }
bool* SimpleMixState::ptrInputSoloState(int i) { return ptrInputLevel(i) ? &inputChannels[i].solo : nullptr; }
float* SimpleMixState::ptrMixLevel(int m) {
  const int r = m + 1;
  return m >= -1 && r < numMixes && static_cast<std::size_t>(r) < mixChannels.size() ? &mixChannels[r].level
                                                                                     : nullptr;
}
bool* SimpleMixState::ptrMixMuteState(int m) { return ptrMixLevel(m) ? &mixChannels[m + 1].mute : nullptr; }
bool* SimpleMixState::ptrMixSoloState(int m) { return ptrMixLevel(m) ? &mixChannels[m + 1].solo : nullptr; }

unsigned char* SimpleMixState::ptrInputRoutedToMix(int i, int m) {
  if (i < 0 || i >= numInputs || m < -1 || m + 1 >= numMixes) return nullptr;
  const std::size_t at = static_cast<std::size_t>(i) * numMixes + (m + 1);
  return at < inputToMixRouting.size() ? &inputToMixRouting[at] : nullptr;
}

unsigned char* SimpleMixState::ptrMixRoutedToOutput(int m, int o, bool left) {
  if (m < -1 || m + 1 >= numMixes || o < -2 || o + 2 >= numOutputs) return nullptr;
  if (m == -1 && o < 0) return nullptr;  // the main mix never feeds a pseudo output
  const std::size_t at = (static_cast<std::size_t>(m + 1) * numOutputs + (o + 2)) * 2 + (left ? 0 : 1);
  if (at >= static_cast<std::size_t>(numMixes) * numOutputs * 2 || at >= mixToOutputRouting.size())
    return nullptr;
  return &mixToOutputRouting[at];
}

template <class T>
void SimpleMixState::store(T* entry, T value) {
  if (!entry) return;
  CriticalSectionLock hold(lock);
  *entry = value;
  dirty = true;
}

// --- Accessors ---

float SimpleMixState::getInputLevel(int i) {
  if (!checkValid()) return 0.0f;
  const float* p = ptrInputLevel(i);
  return p ? *p : 0.0f;
}
void SimpleMixState::setInputLevel(int i, float v) {
  if (checkValid()) store(ptrInputLevel(i), clampLevel(v));
}
float SimpleMixState::getInputPan(int i) {
  if (!checkValid()) return 0.0f;
  const float* p = ptrInputPan(i);
  return p ? *p : 0.0f;
}
void SimpleMixState::setInputPan(int i, float v) {
  if (checkValid()) store(ptrInputPan(i), v);
}
bool SimpleMixState::getInputMuteState(int i) {
  if (!checkValid()) return false;
  const bool* p = ptrInputMuteState(i);
  return p && *p;
}
void SimpleMixState::setInputMuteState(int i, bool on) {
  if (checkValid()) store(ptrInputMuteState(i), on);
}
bool SimpleMixState::getInputSoloState(int i) {
  if (!checkValid()) return false;
  const bool* p = ptrInputSoloState(i);
  return p && *p;
}
void SimpleMixState::setInputSoloState(int i, bool on) {
  if (checkValid()) store(ptrInputSoloState(i), on);
}
bool SimpleMixState::getInputRoutedToMix(int i, int m) {
  if (!checkValid()) return false;
  const unsigned char* p = ptrInputRoutedToMix(i, m);
  return p && *p;
}
void SimpleMixState::setInputRoutedToMix(int i, int m, bool on) {
  if (checkValid()) store(ptrInputRoutedToMix(i, m), static_cast<unsigned char>(on));
}
float SimpleMixState::getMixLevel(int m) {
  if (!checkValid()) return 0.0f;
  const float* p = ptrMixLevel(m);
  return p ? *p : 0.0f;
}
void SimpleMixState::setMixLevel(int m, float v) {
  if (checkValid()) store(ptrMixLevel(m), clampLevel(v));
}
bool SimpleMixState::getMixMuteState(int m) {
  if (!checkValid()) return false;
  const bool* p = ptrMixMuteState(m);
  return p && *p;
}
void SimpleMixState::setMixMuteState(int m, bool on) {
  if (checkValid()) store(ptrMixMuteState(m), on);
}
bool SimpleMixState::getMixSoloState(int m) {
  if (!checkValid()) return false;
  const bool* p = ptrMixSoloState(m);
  return p && *p;
}
void SimpleMixState::setMixSoloState(int m, bool on) {
  if (checkValid()) store(ptrMixSoloState(m), on);
}
bool SimpleMixState::getMixRoutedToOutput(int m, int o, bool left) {
  if (!checkValid()) return false;
  const unsigned char* p = ptrMixRoutedToOutput(m, o, left);
  return p && *p;
}

void SimpleMixState::setMixRoutedToOutput(int m, int o, bool left, bool on) {
  if (!checkValid()) return;
  if (!on || o < 0) {
    store(ptrMixRoutedToOutput(m, o, left), static_cast<unsigned char>(on));
    return;
  }
  CriticalSectionLock hold(lock);
  // A physical output has one feed. When the requested entry does not exist
  // the other feeds are left alone: a bad index changes nothing.
  if (unsigned char* wanted = ptrMixRoutedToOutput(m, o, left)) {
    for (int side = 0; side < 2; ++side) {
      for (int row = 0; row < numMixes; ++row) {
        if (unsigned char* entry = ptrMixRoutedToOutput(row - 1, o, side == 0)) *entry = 0;
      }
    }
    *wanted = 1;
  }
  dirty = true;
}

// --- Whole-state operations ---

void SimpleMixState::resetToDefaultConfiguration(bool markDirty) {
  if (!checkValid()) return;
  CriticalSectionLock hold(lock);
  std::fill(inputToMixRouting.begin(), inputToMixRouting.end(), 0);
  std::fill(mixToOutputRouting.begin(), mixToOutputRouting.end(), 0);
  if (inputChannels.size() < static_cast<std::size_t>(numInputs)) inputChannels.resize(numInputs);
  if (mixChannels.size() < static_cast<std::size_t>(numMixes)) mixChannels.resize(numMixes);
  for (int i = 0; i < numInputs; ++i) {
    inputChannels[i] = kDefaultInput;
    if (unsigned char* route = ptrInputRoutedToMix(i, -1)) *route = 1;
  }
  for (int r = 0; r < numMixes; ++r) mixChannels[r] = kDefaultMix;
  // Only the routes that exist: a state without a main mix or with fewer
  // than two physical outputs gets what fits.
  if (unsigned char* route = ptrMixRoutedToOutput(-1, 0, true)) *route = 1;
  if (unsigned char* route = ptrMixRoutedToOutput(-1, 1, false)) *route = 1;
  if (markDirty) dirty = true;
}

void SimpleMixState::insertInputs(unsigned long long count, unsigned long long position) {
  const std::size_t n = std::min(inputChannels.size(), static_cast<std::size_t>(numInputs));
  if (position >= n) return;
  const std::size_t at = static_cast<std::size_t>(position);
  const std::size_t shift = static_cast<std::size_t>(std::min<unsigned long long>(count, n - at));
  std::copy_backward(inputChannels.begin() + at, inputChannels.begin() + (n - shift),
                     inputChannels.begin() + n);
  std::fill_n(inputChannels.begin() + at, shift, kDefaultInput);
}

void SimpleMixState::removeInput(unsigned long long index) {
  const std::size_t n = std::min(inputChannels.size(), static_cast<std::size_t>(numInputs));
  if (index >= n) return;
  const std::size_t at = static_cast<std::size_t>(index);
  std::copy(inputChannels.begin() + at + 1, inputChannels.begin() + n, inputChannels.begin() + at);
  inputChannels[n - 1] = kDefaultInput;
}

}  // namespace Aud
