#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "host/Config.h"
#include "host/HostHooks.h"
#include "tonebits/foundation/Aud__AudioPreferences.h"

namespace {

using namespace AudioNormalisation;
using namespace AudioTrackGrouping;
using ShotOrigin::eShotOrigin;

class AudioPreferences : public testing::Test {
 protected:
  void SetUp() override { host::resetPreferences(); }
  void TearDown() override { host::resetPreferences(); }
  static double stored(const char* key) { return prefs().getPreference(String(key), 12345.0); }
};

TEST_F(AudioPreferences, DefaultsWithNothingStored) {
  EXPECT_EQ(getApplicationMethod(), eLevelPerOrigin);
  EXPECT_EQ(getUniformLevel(), -18.0f);
  for (int origin = -1; origin <= 9; ++origin) {
    EXPECT_EQ(getLevelFor(eShotOrigin(origin)), -18.0f) << origin;
    EXPECT_EQ(getGroupingCondition(eShotOrigin(origin)), GroupingCondition::eAlways) << origin;
  }
  EXPECT_TRUE(getEnabled());
  EXPECT_EQ(invalidAudioNormalLevel(), 999.0f);
  EXPECT_EQ(audio_get_record_channels(), 4);
  EXPECT_TRUE(audio_playback_lock_to_word_clock());
}

TEST_F(AudioPreferences, EachKindOfImportHasItsOwnKeys) {
  const char* const words[] = {"StereoWavImports",
                               "MultiTrackWavImports",
                               "RecordingsWithVideo",
                               "AudioOnlyRecordings",
                               "MP3Imports",
                               "CDImports",
                               "OtherStereoAudioImports",
                               "OtherMultiTrackAudioImports"};
  for (int origin = 1; origin <= 8; ++origin) {
    SCOPED_TRACE(origin);
    const std::string word = words[origin - 1];
    setLevelFor(-float(origin), eShotOrigin(origin));
    setGroupingCondition(eShotOrigin(origin), GroupingCondition::eGroupingCondition(origin % 3 + 1));
    EXPECT_EQ(stored(("AudioNormalisationLevelFor_" + word).c_str()), -double(origin));
    EXPECT_EQ(prefs().getPreference(String(("TrackGroupingConditionFor_" + word).c_str()), 0),
              origin % 3 + 1);
  }
  for (int origin = 1; origin <= 8; ++origin) {
    EXPECT_EQ(getLevelFor(eShotOrigin(origin)), -float(origin));
    EXPECT_EQ(getGroupingCondition(eShotOrigin(origin)), origin % 3 + 1);
  }
  // Values that name no kind use the bare prefix, all sharing one key.
  setLevelFor(-30.0f, eShotOrigin(0));
  EXPECT_EQ(stored("AudioNormalisationLevelFor_"), -30.0);
  EXPECT_EQ(getLevelFor(eShotOrigin(9)), -30.0f);
  EXPECT_EQ(getLevelFor(eShotOrigin(-7)), -30.0f);
  setGroupingCondition(eShotOrigin(100), GroupingCondition::eSameSource);
  EXPECT_EQ(prefs().getPreference(String("TrackGroupingConditionFor_"), 0), 2);
  EXPECT_EQ(getGroupingCondition(eShotOrigin(0)), GroupingCondition::eSameSource);
}

TEST_F(AudioPreferences, LevelsAreClampedOnTheWayInAndOut) {
  const struct {
    float level;
    double storedUniform, storedPerKind;
  } rows[] = {{6.0f, 0.0, 0.0},          {-40.0f, -36.0, -36.0},  {-36.0f, -36.0, -36.0},
              {0.0f, 0.0, 0.0},          {-12.5f, -12.5, -12.5},  {999.0f, 0.0, 999.0},
              {998.0f, 0.0, 0.0},        {-999.0f, -36.0, -36.0}, {INFINITY, 0.0, 0.0},
              {-INFINITY, -36.0, -36.0}, {NAN, -18.0, -18.0}};
  for (const auto& row : rows) {
    SCOPED_TRACE(row.level);
    setUniformLevel(row.level);
    setLevelFor(row.level, ShotOrigin::eMP3Import);
    EXPECT_EQ(stored("AudioNormalisationUniformLevel"), row.storedUniform);
    EXPECT_EQ(stored("AudioNormalisationLevelFor_MP3Imports"), row.storedPerKind);
    EXPECT_EQ(getUniformLevel(), float(row.storedUniform));
    EXPECT_EQ(getLevelFor(ShotOrigin::eMP3Import), float(row.storedPerKind));
  }
  // Values stored by others are clamped when read.
  const struct {
    double stored;
    float uniform, perKind;
  } reads[] = {{5.0, 0.0f, 0.0f},         {-100.0, -36.0f, -36.0f}, {999.0, 0.0f, 999.0f},
               {999.0000001, 0.0f, 0.0f}, {NAN, -18.0f, -18.0f},    {-20.25, -20.25f, -20.25f}};
  for (const auto& row : reads) {
    SCOPED_TRACE(row.stored);
    prefs().setPreference(String("AudioNormalisationUniformLevel"), row.stored);
    prefs().setPreference(String("AudioNormalisationLevelFor_CDImports"), row.stored);
    EXPECT_EQ(getUniformLevel(), row.uniform);
    EXPECT_EQ(getLevelFor(ShotOrigin::eCDImport), row.perKind);
  }
}

TEST_F(AudioPreferences, ChoicesOutsideOneToThreeReadAsThree) {
  for (int value : {-1, 0, 1, 2, 3, 4, 7, 1 << 30}) {
    SCOPED_TRACE(value);
    const int expected = value >= 1 && value <= 3 ? value : 3;
    setApplicationMethod(Application(value));
    EXPECT_EQ(prefs().getPreference(String("AudioNormalisationApplicationMethod"), 99), value);  // unchecked
    EXPECT_EQ(getApplicationMethod(), expected);
    setGroupingCondition(ShotOrigin::eCDImport, GroupingCondition::eGroupingCondition(value));
    EXPECT_EQ(prefs().getPreference(String("TrackGroupingConditionFor_CDImports"), 99), value);
    EXPECT_EQ(getGroupingCondition(ShotOrigin::eCDImport), expected);
  }
  setEnabled(false);
  EXPECT_FALSE(getEnabled());
  EXPECT_FALSE(prefs().getPreference(String("TrackGroupingEnabled"), true));
  setEnabled(true);
  EXPECT_TRUE(getEnabled());
}

TEST_F(AudioPreferences, GroupingConditionDisplayTexts) {
  EXPECT_EQ(getDisplayString(GroupingCondition::eSameSourceAndTimecode), L"Same source and timecode");
  EXPECT_EQ(getDisplayString(GroupingCondition::eSameSource), L"Same source");
  EXPECT_EQ(getDisplayString(GroupingCondition::eAlways), L"Always");
  host::setResourceText(2451, L"Gleiche Quelle");
  EXPECT_EQ(getDisplayString(GroupingCondition::eSameSource), L"Gleiche Quelle");
  host::setResourceText(2451, L"Same source");
  for (int value : {0, 4, -1, 2449}) {
    EXPECT_EQ(getDisplayString(GroupingCondition::eGroupingCondition(value)), L"") << value;
  }
}

}  // namespace
