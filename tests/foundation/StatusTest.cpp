#include <gtest/gtest.h>

#include <climits>
#include <cstring>

#include "tonebits/foundation/Aud__Status.h"

namespace {

using Aud::eStatus;

TEST(Status, ClassesOverTheWhole32BitEdge) {
  struct Row {
    int32_t value;
    bool ok, failure;
    const char* name;
  };
  const Row rows[] = {
      {INT_MIN, false, false, "<UNKNOWN>"}, {-1, false, false, "<UNKNOWN>"},
      {0, true, false, "sSuccess"},         {1, true, false, "sReady"},
      {2, true, false, "sPending"},         {3, false, false, "<UNKNOWN>"},
      {4, false, false, "<UNKNOWN>"},       {5, false, false, "<UNKNOWN>"},
      {6, false, false, "<UNKNOWN>"},       {7, false, true, "sInvalid"},
      {11, false, true, "sOutOfRange"},     {18, false, true, "sFailedToSetHardwareSampleRateOrSyncSource"},
      {43, false, true, "sEditIsInvalid"},  {44, false, true, "<UNKNOWN>"},
      {45, false, false, "<UNKNOWN>"},      {1000, false, false, "<UNKNOWN>"},
      {INT_MAX, false, false, "<UNKNOWN>"},
  };
  for (const Row& row : rows) {
    const auto s = static_cast<eStatus>(row.value);
    SCOPED_TRACE(row.value);
    EXPECT_EQ(Aud::isOk(s), row.ok);
    EXPECT_EQ(Aud::isFailure(s), row.failure);
    EXPECT_FALSE(Aud::isWarning(s));
    EXPECT_STREQ(Aud::getDebugString(s), row.name);
  }
}

TEST(Status, EveryNamedValueReadsBackItsOwnName) {
  // The names are exported text that logs are searched by: each must be
  // distinct and start with 's'.
  for (int v = 0; v <= 43; ++v) {
    const char* name = Aud::getDebugString(static_cast<eStatus>(v));
    if (v >= 3 && v <= 6) continue;
    EXPECT_EQ(name[0], 's') << v;
    for (int w = 0; w < v; ++w) {
      if (w >= 3 && w <= 6) continue;
      EXPECT_STRNE(name, Aud::getDebugString(static_cast<eStatus>(w)));
    }
  }
  EXPECT_STREQ(Aud::getDebugString(Aud::sIO_SyncSourceTypeNotSupported), "sIO_SyncSourceTypeNotSupported");
  EXPECT_EQ(static_cast<int>(Aud::sRenderingAbortedByCallbackFn), 42);
}

TEST(Status, VersionText) { EXPECT_STREQ(tonebitsDllVersionStr(), "11.1.0.0"); }

}  // namespace
