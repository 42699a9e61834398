#include "tonebits/dsp/Aud__GainCurve.h"

namespace Aud::GainCurve {

namespace {

// The table lookup shared by laws 2 and 3. Clamping x to [lo, hi] keeps the
// row index inside the table: each table reaches at least one row past the
// row that hi falls in. A NaN would truncate to an undefined index, so it is
// handed back before any arithmetic.
template <class Node>
float lookup(const Node* table, float Node::*key, float Node::*result, float step, float lo, float hi,
             float x) noexcept {
  if (x != x) return x;
  x = x < lo ? lo : (x > hi ? hi : x);
  const float q = x / step;
  const Node& node = table[static_cast<int32_t>(q)];
  const float product = (x - node.*key) * node.slope;
  return product + node.*result;
}

struct Range {
  float minU, maxU, minMagnitude, maxMagnitude;
};

template <int N>
struct Law;

template <>
struct Law<Linear> {
  static constexpr Range range{0.0f, 1.5f, 0.0f, 1.5f};
  static float toMagnitude(float u) noexcept { return u; }
  static float toUValue(float m) noexcept { return m; }
};

template <>
struct Law<MixerStyleLog1> {
  static constexpr Range range{0.0f, 1.5f, 0.0f, 4.5099f};
  static float toMagnitude(float u) noexcept {
    using namespace MixerStyleLog1_Private;
    return lookup(UVal2Mag_CurveNodes, &Node::uValue, &Node::magnitude, kUValueStep, range.minU, range.maxU,
                  u);
  }
  static float toUValue(float m) noexcept {
    using namespace MixerStyleLog1_Private;
    if (m == 1.0f) return 1.0f;
    return lookup(Mag2UVal_CurveNodes, &Node::magnitude, &Node::uValue, kMagnitudeStep, range.minMagnitude,
                  range.maxMagnitude, m);
  }
};

template <>
struct Law<ConstantPower1> {
  static constexpr Range range{0.0f, 1.0f, 0.0f, 1.0f};
  static float toMagnitude(float u) noexcept {
    using namespace ConstantPower1_Private;
    return lookup(UVal2Mag_CurveNodes, &Node::uValue, &Node::magnitude, kUValueStep, range.minU, range.maxU,
                  u);
  }
  static float toUValue(float m) noexcept {
    using namespace ConstantPower1_Private;
    if (m == 1.0f) return 1.0f;
    return lookup(Mag2UVal_CurveNodes, &Node::magnitude, &Node::uValue, kMagnitudeStep, range.minMagnitude,
                  range.maxMagnitude, m);
  }
};

}  // namespace

template <int N>
eCurveType Curve<N>::getCurveType() noexcept {
  return static_cast<eCurveType>(N);
}
template <int N>
float Curve<N>::mapUValueToMagnitude(float uValue) noexcept {
  return Law<N>::toMagnitude(uValue);
}
template <int N>
float Curve<N>::mapMagnitudeToUValue(float magnitude) noexcept {
  return Law<N>::toUValue(magnitude);
}
template <int N>
float Curve<N>::minimumUValue() noexcept {
  return Law<N>::range.minU;
}
template <int N>
float Curve<N>::maximumUValue() noexcept {
  return Law<N>::range.maxU;
}
template <int N>
float Curve<N>::minimumMagnitude() noexcept {
  return Law<N>::range.minMagnitude;
}
template <int N>
float Curve<N>::maximumMagnitude() noexcept {
  return Law<N>::range.maxMagnitude;
}

template class Curve<Linear>;
template class Curve<MixerStyleLog1>;
template class Curve<ConstantPower1>;

}  // namespace Aud::GainCurve
