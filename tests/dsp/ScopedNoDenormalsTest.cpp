#include <gtest/gtest.h>

#include <cfenv>
#include <cmath>
#include <thread>
#include <vector>

#include "tonebits/dsp/Aud__Biquad.h"
#include "tonebits/dsp/Aud__ScopedNoDenormals.h"

namespace {

using Aud::ScopedNoDenormals;

// Kept out of the optimiser's reach so the multiplications happen at run
// time, under the mode in force.
float multiply(float a, float b) {
  volatile float va = a, vb = b;
  return va * vb;
}

#if defined(__x86_64__) || defined(__i386__)

TEST(ScopedNoDenormals, FlushesInputsAndResultsOnlyInsideTheScope) {
  ASSERT_FALSE(ScopedNoDenormals::isActiveOnThisThread());
  const float denormal = 1e-39f;
  EXPECT_NE(multiply(denormal, 1.0f), 0.0f);  // denormal in, denormal out
  EXPECT_NE(multiply(1e-20f, 1e-20f), 0.0f);  // normal in, denormal out
  {
    ScopedNoDenormals guard;
    EXPECT_TRUE(ScopedNoDenormals::isActiveOnThisThread());
    EXPECT_EQ(multiply(denormal, 1.0f), 0.0f);             // read as zero
    EXPECT_EQ(multiply(1e-20f, 1e-20f), 0.0f);             // written as zero
    EXPECT_TRUE(std::signbit(multiply(-1e-20f, 1e-20f)));  // keeping the sign
    EXPECT_EQ(multiply(1e-19f, 1e-19f), 1e-19f * 1e-19f);  // normal results untouched
  }
  EXPECT_FALSE(ScopedNoDenormals::isActiveOnThisThread());
  EXPECT_NE(multiply(denormal, 1.0f), 0.0f);
}

TEST(ScopedNoDenormals, NestsAndKeepsFlagsRaisedInside) {
  std::feclearexcept(FE_ALL_EXCEPT);
  {
    ScopedNoDenormals outer;
    {
      ScopedNoDenormals inner;
      EXPECT_NE(multiply(1.0f, 1.0f / 3.0f) + multiply(0.1f, 0.7f), 0.0f);  // inexact
    }
    EXPECT_TRUE(ScopedNoDenormals::isActiveOnThisThread());  // still the outer scope's
  }
  EXPECT_FALSE(ScopedNoDenormals::isActiveOnThisThread());
  EXPECT_TRUE(std::fetestexcept(FE_INEXACT));
  std::feclearexcept(FE_ALL_EXCEPT);
}

TEST(ScopedNoDenormals, BelongsToTheThreadThatMadeIt) {
  bool inside = false, afterwards = true;
  std::thread([&] {
    {
      ScopedNoDenormals guard;
      inside = ScopedNoDenormals::isActiveOnThisThread();
    }
    afterwards = ScopedNoDenormals::isActiveOnThisThread();
  }).join();
  EXPECT_TRUE(inside);
  EXPECT_FALSE(afterwards);
  EXPECT_FALSE(ScopedNoDenormals::isActiveOnThisThread());  // this thread never switched
}

TEST(ScopedNoDenormals, ATailThatWouldBeDenormalBecomesZero) {
  using Aud::Filter::Biquad;
  Biquad start(Biquad::LowPass, 20.0f, 48000.0f, Biquad::ShapeDescriptor(Biquad::ShapeDescriptor::Q, 0.5f),
               0.0, true);
  start.processSample(1e-36f);  // a tail just above the denormal range
  const std::vector<float> silence(2000, 0.0f);
  std::vector<float> free(silence.size()), flushed(silence.size());
  Biquad a = start, b = start;
  a.processBlock(silence.data(), free.data(), unsigned(silence.size()));
  {
    ScopedNoDenormals guard;
    b.processBlock(silence.data(), flushed.data(), unsigned(silence.size()));
  }
  const auto isDenormal = [](float v) { return v != 0.0f && std::fpclassify(v) == FP_SUBNORMAL; };
  int denormalsFree = 0, denormalsFlushed = 0;
  for (size_t i = 0; i < silence.size(); ++i) {
    denormalsFree += isDenormal(free[i]);
    denormalsFlushed += isDenormal(flushed[i]);
  }
  EXPECT_GT(denormalsFree, 100);
  EXPECT_EQ(denormalsFlushed, 0);
  EXPECT_EQ(flushed.back(), 0.0f);
}

#else

TEST(ScopedNoDenormals, DoesNothingWithoutTheModes) {
  ScopedNoDenormals guard;
  EXPECT_FALSE(ScopedNoDenormals::isActiveOnThisThread());
}

#endif

}  // namespace
