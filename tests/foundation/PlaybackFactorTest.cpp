#include <gtest/gtest.h>

#include <bitset>
#include <initializer_list>
#include <vector>

#include "host/HostHooks.h"
#include "tonebits/foundation/Aud__PlaybackFactor.h"

namespace {

using namespace Aud;
using Aud::Util::determineNaturalPlaybackResamplingFactor;

// The rules as a reader of the table has them: lists of values, {} for any.
struct Row {
  std::vector<int> first, second, medium, transfer, third;
  uint32_t factor;
};

const std::vector<Row>& ruleTable() {
  const std::vector<int> any, film{1, 2}, pal{3, 8}, ntsc{4, 5, 9, 10}, six{6};
  const uint32_t none = fNone, f2425 = fx24_25, f1001 = fx1001, f2430 = fx24_30, f2430x = fx24_30 | fx1001;
  static const std::vector<Row> rows = {
      {pal, film, any, any, film, none},    {pal, pal, any, {0}, any, none},
      {pal, pal, any, {7}, film, none},     {pal, pal, any, {3}, film, f2425},
      {pal, pal, any, {3}, {3}, none},      {pal, pal, any, {7}, six, none},
      {pal, pal, any, {3}, six, f2425},     {pal, film, any, any, six, none},
      {ntsc, film, {3}, any, film, f1001},  {ntsc, film, {2}, any, film, none},
      {ntsc, ntsc, any, {0}, any, none},    {ntsc, ntsc, {3}, {7}, film, f1001},
      {ntsc, ntsc, {2}, {7}, film, none},   {ntsc, ntsc, {3}, {3}, film, f2430x},
      {ntsc, ntsc, {2}, {3}, film, f2430},  {ntsc, ntsc, {3}, {3}, {4, 5}, f1001},
      {ntsc, ntsc, {2}, {3}, {4, 5}, none}, {ntsc, ntsc, {3}, {7}, six, f1001},
      {ntsc, ntsc, {2}, {7}, six, none},    {ntsc, ntsc, {3}, {3}, six, f2430x},
      {ntsc, ntsc, {2}, {3}, six, f2430},   {ntsc, film, {3}, any, six, f1001},
      {ntsc, film, {2}, any, six, none},    {film, film, {3}, any, film, f1001},
      {film, film, {2}, any, film, none},   {film, pal, any, {7}, film, none},
      {film, pal, any, {3}, film, f2425},   {film, ntsc, {3}, {7}, film, f1001},
      {film, ntsc, {2}, {7}, film, none},   {film, ntsc, {3}, {3}, film, f2430x},
      {film, ntsc, {2}, {3}, film, f2430},  {six, film, {3}, any, six, f1001},
      {six, film, {2}, any, six, none},     {six, pal, any, {7}, six, none},
      {six, pal, any, {3}, six, f2425},     {six, ntsc, {3}, {7}, six, f1001},
      {six, ntsc, {2}, {7}, six, none},     {six, ntsc, {3}, {3}, six, f2430x},
      {six, ntsc, {2}, {3}, six, f2430}};
  return rows;
}

bool in(const std::vector<int>& cell, int value) {
  if (cell.empty()) return true;
  for (int v : cell) {
    if (v == value) return true;
  }
  return false;
}

// The unknown transfer of film material shown at a video rate, with the
// configuration's defaults.
int transferFor(int first, int second, int transfer, int pulldownFor25, int pulldownFor30) {
  if (transfer != 0 || (first != 1 && first != 6)) return transfer;
  if (second == 3 || second == 8) return pulldownFor25 ? 7 : 3;
  if (second == 4 || second == 5 || second == 9 || second == 10) return pulldownFor30 ? 7 : 3;
  return transfer;
}

eStatus determine(eFactor& out, int first, int second, int medium, int transfer, int third) {
  return determineNaturalPlaybackResamplingFactor(out, Kv::FrameRate(first), Kv::FrameRate(second),
                                                  MediumRollMedium(medium), transfer_type(transfer),
                                                  Kv::FrameRate(third));
}

class PlaybackFactor : public testing::Test {
 protected:
  void TearDown() override { host::clearConfig(); }
};

TEST_F(PlaybackFactor, AgreesWithTheRuleTableAndReachesEveryRow) {
  const std::vector<Row>& rows = ruleTable();
  ASSERT_EQ(rows.size(), 39u);
  std::bitset<39> reached;
  // Every value of each set, and values in no set on either side.
  const std::initializer_list<int> rates = {-1, 0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11};
  for (int first : rates) {
    for (int second : rates) {
      for (int medium : {0, 2, 3, 4}) {
        for (int transfer : {0, 3, 5, 7}) {
          for (int third : rates) {
            const int t = transferFor(first, second, transfer, 0, 1);
            std::size_t match = rows.size();
            for (std::size_t i = 0; i < rows.size() && match == rows.size(); ++i) {
              const Row& r = rows[i];
              if (in(r.first, first) && in(r.second, second) && in(r.medium, medium) && in(r.transfer, t) &&
                  in(r.third, third))
                match = i;
            }
            eFactor out = eFactor(0xABC00000u);
            const eStatus status = determine(out, first, second, medium, transfer, third);
            if (match == rows.size()) {
              ASSERT_EQ(status, sInvalid);
              ASSERT_EQ(out, eFactor(0xABC00000u)) << "out must be left as it was";
            } else {
              reached.set(match);
              ASSERT_EQ(status, sSuccess)
                  << first << ' ' << second << ' ' << medium << ' ' << transfer << ' ' << third;
              ASSERT_EQ(uint32_t(out), rows[match].factor) << "row " << match + 1;
            }
          }
        }
      }
    }
  }
  EXPECT_TRUE(reached.all()) << reached;
}

TEST_F(PlaybackFactor, Examples) {
  eFactor out = fx2;
  for (int medium : {-1, 0, 2, 3, 7}) {
    EXPECT_EQ(determine(out, 1, 3, medium, 3, 1), sSuccess);
    EXPECT_EQ(out, fx24_25) << medium;  // film shown at 25 by a speed change
  }
  EXPECT_EQ(determine(out, 3, 3, 2, 0, 1), sSuccess);
  EXPECT_EQ(out, fNone);
  EXPECT_EQ(determine(out, 1, 4, 3, 0, 1), sSuccess);
  EXPECT_EQ(out, fx1001);  // no key: pulldown, row 28
  out = fx2;
  EXPECT_EQ(determine(out, 7, 7, 3, 7, 7), sInvalid);
  EXPECT_EQ(out, fx2);
}

TEST_F(PlaybackFactor, ConfigurationDecidesAnUnknownFilmTransfer) {
  const struct {
    int configured;  // -1: key absent
    int first, second, medium, third;
    eStatus status;
    uint32_t factor;
  } rows[] = {// Video at 30: pulldown unless the key says 0.
              {-1, 1, 4, 3, 1, sSuccess, fx1001},
              {1, 1, 4, 3, 1, sSuccess, fx1001},
              {0, 1, 4, 3, 1, sSuccess, fx24_30 | fx1001},
              {0, 1, 9, 2, 1, sSuccess, fx24_30},
              {-5, 1, 10, 2, 1, sSuccess, fNone},  // any non-zero value means pulldown
              {-1, 6, 5, 3, 6, sSuccess, fx1001},
              {0, 6, 5, 3, 6, sSuccess, fx24_30 | fx1001},
              // Video at 25: a speed change unless the key says otherwise.
              {-1, 1, 3, 2, 1, sSuccess, fx24_25},
              {0, 1, 8, 2, 1, sSuccess, fx24_25},
              {1, 1, 3, 2, 1, sSuccess, fNone},
              {-1, 6, 8, 3, 6, sSuccess, fx24_25},
              {2, 6, 8, 3, 6, sSuccess, fNone},
              // The key plays no part anywhere else.
              {0, 2, 4, 3, 1, sInvalid, 0},
              {1, 2, 3, 3, 1, sInvalid, 0},
              {0, 1, 6, 3, 1, sInvalid, 0},
              {1, 1, 7, 3, 1, sInvalid, 0},
              {0, 1, 1, 3, 1, sSuccess, fx1001},
              {1, 1, 1, 2, 1, sSuccess, fNone}};
  for (const auto& row : rows) {
    SCOPED_TRACE(testing::Message() << row.configured << ' ' << row.first << ' ' << row.second);
    host::clearConfig();
    if (row.configured != -1) host::setConfigInt("video_in_film_pulldown", row.configured);
    eFactor out = eFactor(0xF0000000u);
    EXPECT_EQ(determine(out, row.first, row.second, row.medium, 0, row.third), row.status);
    EXPECT_EQ(uint32_t(out), row.status == sSuccess ? row.factor : 0xF0000000u);
  }
}

}  // namespace
