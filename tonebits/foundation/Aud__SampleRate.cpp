#include "tonebits/foundation/Aud__SampleRate.h"

#include <atomic>
#include <cmath>
#include <cstdio>
#include <string_view>
#include <typeinfo>

#include "host/Exception.h"
#include "host/Log.h"
#include "host/NamedObjects.h"
#include "host/Ptr.h"
#include "host/Resources.h"

namespace Aud {

namespace {

constexpr char kRevision = 'A';
constexpr const char* kProjectRateName = "Aud__CurrentProjectHardwareSampleRate";

// The named object: the namespace keeps iObjects, so the word lives in one.
class ProjectRateObject final : public iObject {
 public:
  SampleRate rate;
};

iObject* createProjectRateObject() { return new ProjectRateObject(); }

// Frequencies of the concrete bases, indexed by eBaseSampleRate; srProject
// has none of its own.
constexpr unsigned int kHertz[] = {0, 0, 11025, 16000, 22050, 24000, 32000, 44100, 48000, 96000};
constexpr int kNumBases = sizeof(kHertz) / sizeof(kHertz[0]);

unsigned int concreteHertz(eBaseSampleRate base) noexcept {
  const auto index = static_cast<uint32_t>(base);
  return index < uint32_t(kNumBases) ? kHertz[index] : 0u;
}

struct FactorPair {
  uint32_t up, down;
};
constexpr FactorPair kPairs[] = {{fx24_25, fx25_24}, {fx1001, fx1_1001}, {fx30_24, fx24_30}, {fx2, fx1_2}};

bool contributes(uint32_t flags, uint32_t flag, uint32_t opposite) noexcept {
  return (flags & flag) != 0 && (flags & opposite) == 0;
}

bool hasBothOfAPair(uint32_t flags) noexcept {
  for (const FactorPair& p : kPairs) {
    if ((flags & p.up) && (flags & p.down)) return true;
  }
  return false;
}

SampleRate readProjectRate() {
  SampleRate* object = Private::getProjectHardwareSampleRateNamedObject();
  if (!object) {
    throw Kv::Exception::RuntimeError("Failed to find project sample rate named object!", "Aud__SampleRate",
                                      37);
  }
  return std::atomic_ref<SampleRate>(*object).load(std::memory_order_relaxed);
}

// The project rate's base. The host keeps a concrete base there; should it
// ever hold srProject, that is reported as no frequency rather than followed.
eBaseSampleRate projectBase() {
  const eBaseSampleRate base = readProjectRate().baseSampleRate();
  return base == srProject ? srNone : base;
}

void warn(const char* text) {
  tarn_printf("%s", text);
  std::fputs(text, stdout);
}

// The conversions of sscanf(text, "[%c][%d]", ...), without its undefined
// behaviour on numbers too large: such a number is not a conversion here.
struct ScannedText {
  int conversions = 0;
  char revision = 0;
  int64_t number = 0;
};

ScannedText scanRateText(std::string_view text) {
  ScannedText scanned;
  const std::size_t end = text.find('\0');  // a C text ends at its first NUL
  if (end != std::string_view::npos) text = text.substr(0, end);
  std::size_t i = 0;
  if (i >= text.size() || text[i] != '[') return scanned;
  if (++i >= text.size()) return scanned;
  scanned.revision = text[i++];
  scanned.conversions = 1;
  if (i >= text.size() || text[i] != ']') return scanned;
  if (++i >= text.size() || text[i] != '[') return scanned;
  ++i;
  while (i < text.size() && (text[i] == ' ' || (text[i] >= '\t' && text[i] <= '\r'))) ++i;
  bool negative = false;
  if (i < text.size() && (text[i] == '+' || text[i] == '-')) negative = text[i++] == '-';
  const std::size_t firstDigit = i;
  // Digits past the 32-bit range still count as read, so the magnitude is
  // capped just above it rather than grown without bound.
  constexpr int64_t kCap = int64_t(1) << 33;
  int64_t magnitude = 0;
  for (; i < text.size() && text[i] >= '0' && text[i] <= '9'; ++i) {
    magnitude = magnitude * 10 + (text[i] - '0');
    if (magnitude > kCap) magnitude = kCap;
  }
  if (i == firstDigit) return scanned;
  const int64_t number = negative ? -magnitude : magnitude;
  // Both the signed form written by asString and the unsigned form of the
  // same word are accepted.
  if (number < int64_t(INT32_MIN) || number > int64_t(UINT32_MAX)) return scanned;
  scanned.number = number;
  scanned.conversions = 2;
  return scanned;
}

}  // namespace

SampleRate::SampleRate(const String& text) { setFromString(text); }

void SampleRate::setFromString(const String& text) {
  const ScannedText scanned = scanRateText(text.view());
  if (scanned.conversions != 2) {
    warn("Warning: encountered unreadable SampleRate value!\n");
    word_ = 0;
  } else if (scanned.revision != kRevision) {
    warn("Warning: encountered unrecognized SampleRate revision!\n");
    word_ = 0;
  } else {
    word_ = static_cast<uint32_t>(scanned.number);  // modulo 2^32: -1 is the word 0xFFFFFFFF
  }
}

unsigned int SampleRate::calcBaseSampleRate(eBaseSampleRate base) {
  if (base == srProject) return concreteHertz(projectBase());
  return concreteHertz(base);
}

eBaseSampleRate SampleRate::calcSampleRate(unsigned int hertz) noexcept {
  for (int base = sr11025; base < kNumBases; ++base) {
    if (kHertz[base] == hertz) return eBaseSampleRate(base);
  }
  return srNone;
}

double SampleRate::calcFactor(eFactor f) noexcept {
  const uint32_t flags = f;
  double multiplier = 1.0;
  if (contributes(flags, fx24_25, fx25_24)) multiplier = 0.96;
  if (contributes(flags, fx25_24, fx24_25)) multiplier = 1.0416666666666667;
  if (contributes(flags, fx1001, fx1_1001)) multiplier *= 1.001;
  if (contributes(flags, fx1_1001, fx1001)) multiplier /= 1.001;
  if (contributes(flags, fx30_24, fx24_30)) multiplier *= 1.25;
  if (contributes(flags, fx24_30, fx30_24)) multiplier *= 0.8;
  if (contributes(flags, fx2, fx1_2)) multiplier *= 2.0;
  if (contributes(flags, fx1_2, fx2)) multiplier *= 0.5;
  return multiplier;
}

eFactor SampleRate::invert(eFactor f) noexcept {
  uint32_t inverted = uint32_t(f) & ~kBaseMask;
  for (const FactorPair& p : kPairs) {
    const uint32_t pairBits = uint32_t(f) & (p.up | p.down);
    inverted &= ~(p.up | p.down);
    if (pairBits & p.up) inverted |= p.down;
    if (pairBits & p.down) inverted |= p.up;
  }
  return eFactor(inverted);
}

eStatus SampleRate::determineFactorFromFloat(eFactor& out, double multiplier) noexcept {
  constexpr double kTolerance = 1e-6;
  if (std::fabs(1.0 - multiplier) < kTolerance) {
    out = fNone;
    return sSuccess;
  }
  for (uint32_t n = 1; n <= 254; ++n) {
    const uint32_t flags = n << 5;
    if (hasBothOfAPair(flags)) continue;
    if (std::fabs(calcFactor(eFactor(flags)) - multiplier) < kTolerance) {
      out = eFactor(flags);
      return sSuccess;
    }
  }
  out = fNone;
  return sInvalid;
}

SampleRate SampleRate::specialized() const {
  SampleRate copy = *this;
  if (baseSampleRate() == srProject) copy.baseSampleRate(readProjectRate().baseSampleRate());
  return copy;
}

String SampleRate::asString() const {
  char prefix[32];
  std::snprintf(prefix, sizeof(prefix), "[%c][%d] ", kRevision, static_cast<int32_t>(word_));
  String text(prefix);
  text += String(getDisplayString(baseSampleRate()));
  const WString factorText = getDisplayString(factor());
  if (!factorText.empty()) {
    text += " x ";
    text += String(factorText);
  }
  return text;
}

SampleRate getProjectHardwareSampleRate() { return readProjectRate(); }

namespace Private {
SampleRate* getProjectHardwareSampleRateNamedObject() {
  iObject* object = Kv::NamedObjectsNamespace::getGlobalNamespaceInstance().findOrCreate_(
      typeid(SampleRate), kProjectRateName, &createProjectRateObject);
  auto* holder = dynamic_cast<ProjectRateObject*>(object);
  return holder ? &holder->rate : nullptr;
}
}  // namespace Private

WString getDisplayString(eBaseSampleRate base) {
  constexpr int kUnitText = 74, kInvalidText = 56, kProjectText = 2082;
  static constexpr const wchar_t* kNumbers[] = {nullptr, nullptr, L"11.025 ", L"16 ", L"22.05 ",
                                                L"24 ",  L"32 ",  L"44.1 ",   L"48 ", L"96 "};
  const auto index = static_cast<uint32_t>(base);
  if (index == uint32_t(srProject)) return resourceStrW(kProjectText, 0);
  if (index >= uint32_t(kNumBases) || !kNumbers[index]) return paddedResourceStrW(kInvalidText, L"< ", L" >");
  return WString(kNumbers[index]) + resourceStrW(kUnitText, 0);
}

WString getDisplayString(eFactor factor) {
  struct FlagText {
    uint32_t flag, opposite;
    const wchar_t* text;
  };
  static constexpr FlagText kTexts[] = {
      {fx24_25, fx25_24, L" x 24/25"}, {fx25_24, fx24_25, L" x 25/24"},
      {fx1001, fx1_1001, L" x 1.001"}, {fx1_1001, fx1001, L" x 1/1.001"},
      {fx30_24, fx24_30, L" x 30/24"}, {fx24_30, fx30_24, L" x 24/30"},
      {fx2, fx1_2, L" x 2"},           {fx1_2, fx2, L" x 1/2"},
  };
  WString text;
  for (const FlagText& t : kTexts) {
    if (contributes(factor, t.flag, t.opposite)) text += t.text;
  }
  if (!text.empty()) text.erase(0, 3);
  return text;
}

WString getDisplayString(SampleRate rate) {
  WString text = getDisplayString(rate.baseSampleRate());
  const WString factorText = getDisplayString(rate.factor());
  if (!factorText.empty()) {
    text += L" x ";
    text += factorText;
  }
  return text;
}

}  // namespace Aud

template class SearchableVector<Aud::SampleRate>;
