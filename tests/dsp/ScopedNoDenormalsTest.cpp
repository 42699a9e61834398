#include <gtest/gtest.h>

#include <cfenv>
#include <cmath>
#include <thread>

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

TEST(ScopedNoDenormals, FlushesOnlyInsideTheScopeAndRestores) {
  ASSERT_FALSE(ScopedNoDenormals::isActiveOnThisThread());
  const float denormal = 1e-39f;
  EXPECT_NE(multiply(denormal, 1.0f), 0.0f);  // denormal in, denormal out
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
  // The mode belongs to the thread that set it.
  bool inside = false, afterwards = true;
  std::thread([&] {
    {
      ScopedNoDenormals guard;
      inside = ScopedNoDenormals::isActiveOnThisThread();
    }
    afterwards = ScopedNoDenormals::isActiveOnThisThread();
  }).join();
  EXPECT_TRUE(inside && !afterwards);
  // Nested scopes restore the outer mode and keep flags raised inside.
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

#else

TEST(ScopedNoDenormals, DoesNothingWithoutTheModes) {
  ScopedNoDenormals guard;
  EXPECT_FALSE(ScopedNoDenormals::isActiveOnThisThread());
}

#endif

}  // namespace
