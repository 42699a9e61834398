#include <gtest/gtest.h>

#include <climits>
#include <cstring>

#include "tonebits/foundation/Aud__Status.h"

namespace {

using Aud::eStatus;

TEST(Status, ClassesAndNamesOverTheWhole32BitEdge) {
  // 0 to 2 are ok and 7 to 44 failures; only 0 to 2 and 7 to 43 are named.
  for (int32_t v : {INT_MIN, -1, 0, 1, 2, 3, 6, 7, 11, 43, 44, 45, INT_MAX}) {
    const auto s = static_cast<eStatus>(v);
    EXPECT_EQ(Aud::isOk(s), v >= 0 && v <= 2) << v;
    EXPECT_EQ(Aud::isFailure(s), v >= 7 && v <= 44) << v;
    EXPECT_FALSE(Aud::isWarning(s)) << v;
    EXPECT_EQ(std::strcmp(Aud::getDebugString(s), "<UNKNOWN>") == 0, (v < 0 || v > 2) && (v < 7 || v > 43))
        << v;
  }
  const std::pair<int, const char*> names[] = {{0, "sSuccess"}, {1, "sReady"},       {2, "sPending"},
                                               {7, "sInvalid"}, {11, "sOutOfRange"}, {43, "sEditIsInvalid"}};
  for (const auto& [v, name] : names) EXPECT_STREQ(Aud::getDebugString(static_cast<eStatus>(v)), name);
  EXPECT_STREQ(Aud::getDebugString(eStatus(18)), "sFailedToSetHardwareSampleRateOrSyncSource");
  EXPECT_STREQ(Aud::getDebugString(Aud::sIO_SyncSourceTypeNotSupported), "sIO_SyncSourceTypeNotSupported");
  // The names are exported text that logs are searched by: each is its own.
  for (int v = 0; v <= 43; v += v == 2 ? 5 : 1) {
    const char* name = Aud::getDebugString(static_cast<eStatus>(v));
    EXPECT_EQ(name[0], 's') << v;
    for (int w = 0; w < v; w += w == 2 ? 5 : 1)
      EXPECT_STRNE(name, Aud::getDebugString(static_cast<eStatus>(w)));
  }
  EXPECT_EQ(static_cast<int>(Aud::sRenderingAbortedByCallbackFn), 42);
  EXPECT_STREQ(tonebitsDllVersionStr(), "11.1.0.0");
}

}  // namespace
