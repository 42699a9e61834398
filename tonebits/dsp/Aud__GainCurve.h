// Fader laws. A gain curve maps a fader position, the U value (0 at the
// bottom of the fader), to a linear gain, the magnitude (1.0 is unity), and
// back. Three laws, each a class of static members named by its curve type:
//
//   Curve<1>  Linear          identity, U 0 ... 1.5
//   Curve<2>  MixerStyleLog1  gain in dB piecewise linear in U (breakpoints
//                             at multiples of 1/72: -60, -40, -30, -10, -5,
//                             0, +5, +10 dB), U 0 ... 1.5, magnitude 0 ... 4.5099
//   Curve<3>  ConstantPower1  magnitude = sin(U x pi/2), U 0 ... 1
//
// Laws 2 and 3 read constant node tables, so every mapping costs one
// division, one truncation and one multiply and add in single precision:
//
//   i = int(x / step);  result = (x - key[i]) x slope[i] + value[i]
//
// where step is the float nearest the table's step (so x / step can fall
// just below a whole number: U 1.0 reads row 999 of law 2's table). A
// magnitude of exactly 1.0 maps to U 1.0 without a lookup.
//
// Inputs outside a curve's range are clamped to its minimum and maximum
// before the lookup, and a NaN comes back unchanged without touching a
// table. Curve<1> returns its input unchanged in both directions.
//
// Everything here is constant: any thread may call at any time.
#pragma once

#include <cstdint>

#include "tonebits/export.h"

namespace Aud::GainCurve {

enum eCurveType : int32_t { Linear = 1, MixerStyleLog1 = 2, ConstantPower1 = 3 };

// One table row. In a U-to-magnitude table the key is uValue and the result
// magnitude, slope being d(magnitude)/d(U) to the next row; in a
// magnitude-to-U table the key is magnitude and the result uValue, slope
// being d(U)/d(magnitude). The fourth float is 0 in every row.
namespace MixerStyleLog1_Private {

struct Node {
  float uValue;
  float magnitude;
  float slope;
  float reserved;
};

inline constexpr unsigned kNumUVal2MagNodes = 1502;  // U 0.000 ... 1.501, step 0.001
inline constexpr unsigned kNumMag2UValNodes = 903;   // magnitude 0.000 ... 4.510, step 0.005
inline constexpr float kUValueStep = 0.001f;
inline constexpr float kMagnitudeStep = 0.005f;

extern TONEBITS_API const Node UVal2Mag_CurveNodes[kNumUVal2MagNodes];
extern TONEBITS_API const Node Mag2UVal_CurveNodes[kNumMag2UValNodes];

}  // namespace MixerStyleLog1_Private

namespace ConstantPower1_Private {

struct Node {
  float uValue;
  float magnitude;
  float slope;
  float reserved;
};

inline constexpr unsigned kNumUVal2MagNodes = 101;  // U 0.00 ... 1.00, step 0.01
inline constexpr unsigned kNumMag2UValNodes = 101;  // magnitude 0.00 ... 1.00, step 0.01
inline constexpr float kUValueStep = 0.01f;
inline constexpr float kMagnitudeStep = 0.01f;

extern TONEBITS_API const Node UVal2Mag_CurveNodes[kNumUVal2MagNodes];
extern TONEBITS_API const Node Mag2UVal_CurveNodes[kNumMag2UValNodes];

}  // namespace ConstantPower1_Private

// N is an eCurveType value: Curve<2> and Curve<MixerStyleLog1> are the same.
template <int N>
class Curve {
  static_assert(N >= Linear && N <= ConstantPower1, "no such gain curve");

 public:
  Curve() noexcept = default;
  Curve(const Curve&) noexcept = default;
  // The class holds nothing, so assignment has nothing to do.
  Curve& operator=(const Curve&) noexcept { return *this; }

  static eCurveType getCurveType() noexcept;

  static float mapUValueToMagnitude(float uValue) noexcept;
  static float mapMagnitudeToUValue(float magnitude) noexcept;

  static float minimumUValue() noexcept;
  static float maximumUValue() noexcept;
  static float minimumMagnitude() noexcept;
  // For law 2 this is 4.5099, the largest magnitude whose lookup stays in the
  // table's last interval, not the magnitude at maximumUValue() (4.50657).
  static float maximumMagnitude() noexcept;
};

extern template class TONEBITS_API Curve<Linear>;
extern template class TONEBITS_API Curve<MixerStyleLog1>;
extern template class TONEBITS_API Curve<ConstantPower1>;

}  // namespace Aud::GainCurve
