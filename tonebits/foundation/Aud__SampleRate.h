// Aud::SampleRate names an audio sample rate as a base rate from a short list
// plus a set of speed-change factors (film/video pull-downs, the 1.001 video
// drift, doubling and halving), stored and compared as one 32-bit word:
//
//   bits 0 to 4    the base rate, an eBaseSampleRate
//   bits 5 to 31   the factor flags, an eFactor
//
// Settings files store the word as the text "[A][<word as signed decimal>]",
// so the layout and every value below are fixed.
//
// The factor flags come in four pairs of opposites; a pair with both members
// set counts as neither. Factor arguments never touch the base: their low
// five bits are ignored.
//
// The base srProject stands for the current project's hardware rate, one
// process-wide SampleRate that the host keeps as the named object
// "Aud__CurrentProjectHardwareSampleRate". Reading it (calcBaseSampleRate of
// srProject, specialized, getProjectHardwareSampleRate) throws
// Kv::Exception::RuntimeError when the host cannot provide the object.
// Threads that set the project rate while others read it store the word with
// std::atomic_ref<Aud::SampleRate>(*object).store(rate); the library reads it
// the same way.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "host/OS.h"
#include "host/String.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__Status.h"

namespace Aud {

enum eBaseSampleRate : int32_t {
  srNone = 0,
  srProject = 1,
  sr11025 = 2,
  sr16000 = 3,
  sr22050 = 4,
  sr24000 = 5,
  sr32000 = 6,
  sr44100 = 7,
  sr48000 = 8,
  sr96000 = 9,
};

enum eFactor : uint32_t {
  fNone = 0,
  fx24_25 = 0x20,    // x 0.96
  fx25_24 = 0x40,    // x 25/24
  fx1001 = 0x80,     // x 1.001
  fx1_1001 = 0x100,  // / 1.001
  fx30_24 = 0x200,   // x 1.25
  fx24_30 = 0x400,   // x 0.8
  fx2 = 0x800,       // x 2
  fx1_2 = 0x1000,    // x 0.5
};

constexpr eFactor operator|(eFactor a, eFactor b) noexcept { return eFactor(uint32_t(a) | uint32_t(b)); }
constexpr eFactor operator&(eFactor a, eFactor b) noexcept { return eFactor(uint32_t(a) & uint32_t(b)); }

class TONEBITS_API SampleRate {
 public:
  static constexpr uint32_t kBaseMask = 0x1F;

  constexpr SampleRate() noexcept = default;
  constexpr SampleRate(eBaseSampleRate base, eFactor factor) noexcept
      : word_((uint32_t(base) & kBaseMask) | (uint32_t(factor) & ~kBaseMask)) {}
  // Reads the text form; see setFromString.
  explicit SampleRate(const String& text);
  constexpr SampleRate(const SampleRate&) noexcept = default;
  constexpr SampleRate& operator=(const SampleRate&) noexcept = default;

  friend constexpr bool operator==(SampleRate a, SampleRate b) noexcept { return a.word_ == b.word_; }

  // The base is not srNone.
  constexpr bool valid() const noexcept { return (word_ & kBaseMask) != 0; }

  constexpr eBaseSampleRate baseSampleRate() const noexcept { return eBaseSampleRate(word_ & kBaseMask); }
  constexpr void baseSampleRate(eBaseSampleRate base) noexcept {
    word_ = (word_ & ~kBaseMask) | (uint32_t(base) & kBaseMask);
  }
  constexpr eFactor factor() const noexcept { return eFactor(word_ & ~kBaseMask); }
  constexpr void factor(eFactor f) noexcept { word_ = (word_ & kBaseMask) | (uint32_t(f) & ~kBaseMask); }
  constexpr void addFactor(eFactor f) noexcept { word_ |= uint32_t(f) & ~kBaseMask; }
  constexpr void removeFactor(eFactor f) noexcept { word_ &= ~(uint32_t(f) & ~kBaseMask); }

  // Hertz of a base: the table value, that of the project rate's base for
  // srProject (may throw), 0 for srNone and numbers no base names.
  static unsigned int calcBaseSampleRate(eBaseSampleRate base);
  unsigned int calcBaseSampleRate() const { return calcBaseSampleRate(baseSampleRate()); }
  // The base whose frequency is exactly hertz, or srNone.
  static eBaseSampleRate calcSampleRate(unsigned int hertz) noexcept;

  // The product of the contributing pairs' multipliers, in pair order: the
  // first pair sets 0.96 or 25/24, then x or / 1.001, x 1.25 or 0.8, x 2 or 0.5.
  static double calcFactor(eFactor f) noexcept;
  double calcFactor() const noexcept { return calcFactor(factor()); }
  // Base hertz times the factor's multiplier (may throw for srProject).
  double calcCombinedSampleRate() const { return double(calcBaseSampleRate()) * calcFactor(); }

  // Exchanges the members of every pair; the low five bits are dropped.
  static eFactor invert(eFactor f) noexcept;
  // The first flag set, among the 254 of bits 5 to 12 taken in ascending
  // order and skipping any with both members of a pair, whose multiplier is
  // within 1e-6 of multiplier (fNone when 1.0 is). sInvalid and fNone when
  // none is.
  static eStatus determineFactorFromFloat(eFactor& out, double multiplier) noexcept;

  // This rate with srProject replaced by the project rate's base (may throw).
  SampleRate specialized() const;

  // "[A][<word>] " then the display text, for settings files and logs.
  String asString() const;

 private:
  // Reads "[%c][%d]" at the start of text; what follows is ignored. Text
  // without both a character and a number that fits 32 bits, or with a
  // revision other than 'A', gives the word 0 and a console warning.
  void setFromString(const String& text);

  uint32_t word_ = 0;
};

// A copy of the project hardware rate. Throws Kv::Exception::RuntimeError
// when the host has no named object for it.
TONEBITS_API SampleRate getProjectHardwareSampleRate();

namespace Private {
// The project hardware rate object itself, found or created through the
// host, or null when the host cannot provide it. The host sets the project
// rate through it.
TONEBITS_API SampleRate* getProjectHardwareSampleRateNamedObject();
}  // namespace Private

// "48 kHz" style text; srProject has its own text and anything outside 1 to
// 9 the invalid text "< ... >".
TONEBITS_API WString getDisplayString(eBaseSampleRate base);
// The contributing flags' texts joined by " x " in flag order ("24/25 x
// 1/1.001"); empty when no pair contributes.
TONEBITS_API WString getDisplayString(eFactor factor);
// The base's text, then " x " and the factor's text if it has one.
TONEBITS_API WString getDisplayString(SampleRate rate);

}  // namespace Aud

// A vector with a linear search by equality.
template <class T>
class SearchableVector : public std::vector<T, StdAllocator<T>> {
 public:
  using std::vector<T, StdAllocator<T>>::vector;

  // The index of the first element equal to value, or size() when none is.
  std::size_t find(const T& value) const;
};

template <class T>
std::size_t SearchableVector<T>::find(const T& value) const {
  std::size_t i = 0;
  for (const T& element : *this) {
    if (element == value) return i;
    ++i;
  }
  return i;
}

extern template class TONEBITS_API SearchableVector<Aud::SampleRate>;
