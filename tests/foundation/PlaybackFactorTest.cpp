#include <gtest/gtest.h>

#include <algorithm>
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
  return cell.empty() || std::find(cell.begin(), cell.end(), value) != cell.end();
}

// The unknown transfer of film material shown at a video rate, as the
// configuration key decides it: absent (-1), pulldown at 30 frames and a
// speed change at 25; otherwise pulldown at both unless it is 0.
int transferFor(int first, int second, int transfer, int configured) {
  if (transfer != 0 || (first != 1 && first != 6)) return transfer;
  if (second == 3 || second == 8) return configured != -1 && configured != 0 ? 7 : 3;
  if (second == 4 || second == 5 || second == 9 || second == 10) return configured != 0 ? 7 : 3;
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
  for (int configured : {-1, 0, -5}) {
    host::clearConfig();
    if (configured != -1) host::setConfigInt("video_in_film_pulldown", configured);
    for (int first : rates)
      for (int second : rates)
        for (int medium : {-1, 0, 2, 3, 4, 7})
          for (int transfer : {0, 3, 5, 7})
            for (int third : rates) {
              const int t = transferFor(first, second, transfer, configured);
              std::size_t match = 0;
              while (match < rows.size() &&
                     !(in(rows[match].first, first) && in(rows[match].second, second) &&
                       in(rows[match].medium, medium) && in(rows[match].transfer, t) &&
                       in(rows[match].third, third)))
                ++match;
              // No row: sInvalid, and out is left as it was.
              eFactor out = eFactor(0xABC00000u);
              const eStatus status = determine(out, first, second, medium, transfer, third);
              const bool none = match == rows.size();
              if (!none) reached.set(match);
              ASSERT_EQ(std::make_pair(status, uint32_t(out)),
                        std::make_pair(none ? sInvalid : sSuccess, none ? 0xABC00000u : rows[match].factor))
                  << "key " << configured << ": " << first << ' ' << second << ' ' << medium << ' '
                  << transfer << ' ' << third << ", row " << match + 1;
            }
  }
  EXPECT_TRUE(reached.all()) << reached;
}

}  // namespace
