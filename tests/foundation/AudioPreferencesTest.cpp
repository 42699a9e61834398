#include <gtest/gtest.h>

#include <cmath>
#include <sstream>
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
  static double stored(const std::string& key) { return prefs().getPreference(String(key.c_str()), 12345.0); }
  static int storedInt(const std::string& key) { return prefs().getPreference(String(key.c_str()), 99); }
};

TEST_F(AudioPreferences, DefaultsAndEachKindsOwnKeys) {
  EXPECT_EQ(getApplicationMethod(), eLevelPerOrigin);
  EXPECT_EQ(getUniformLevel(), -18.0f);
  EXPECT_EQ(getLevelFor(eShotOrigin(5)), -18.0f);
  EXPECT_EQ(getGroupingCondition(eShotOrigin(5)), GroupingCondition::eAlways);
  EXPECT_TRUE(getEnabled());
  EXPECT_EQ(invalidAudioNormalLevel(), 999.0f);
  EXPECT_EQ(audio_get_record_channels(), 4);
  EXPECT_TRUE(audio_playback_lock_to_word_clock());

  std::istringstream words(
      "StereoWavImports MultiTrackWavImports RecordingsWithVideo AudioOnlyRecordings MP3Imports CDImports "
      "OtherStereoAudioImports OtherMultiTrackAudioImports");
  for (int origin = 1; origin <= 8; ++origin) {
    setLevelFor(-float(origin), eShotOrigin(origin));
    setGroupingCondition(eShotOrigin(origin), GroupingCondition::eGroupingCondition(origin % 3 + 1));
  }
  for (int origin = 1; origin <= 8; ++origin) {
    std::string word;
    words >> word;
    EXPECT_EQ(stored("AudioNormalisationLevelFor_" + word), -double(origin));
    EXPECT_EQ(storedInt("TrackGroupingConditionFor_" + word), origin % 3 + 1);
    EXPECT_EQ(getLevelFor(eShotOrigin(origin)), -float(origin));
    EXPECT_EQ(getGroupingCondition(eShotOrigin(origin)), origin % 3 + 1);
  }
  // Values that name no kind use the bare prefix, all sharing one key.
  setLevelFor(-30.0f, eShotOrigin(0));
  EXPECT_EQ(stored("AudioNormalisationLevelFor_"), -30.0);
  EXPECT_EQ(getLevelFor(eShotOrigin(-7)), -30.0f);
  setGroupingCondition(eShotOrigin(100), GroupingCondition::eSameSource);
  EXPECT_EQ(storedInt("TrackGroupingConditionFor_"), 2);
  EXPECT_EQ(getGroupingCondition(eShotOrigin(0)), GroupingCondition::eSameSource);
}

TEST_F(AudioPreferences, LevelsAreClampedOnTheWayInAndOut) {
  // A level written, and what the uniform and the per-kind keys then hold.
  const struct {
    double level, uniform, perKind;
  } writes[] = {{6.0, 0.0, 0.0},           {-40.0, -36.0, -36.0}, {-36.0, -36.0, -36.0},
                {-12.5, -12.5, -12.5},     {999.0, 0.0, 999.0},   {998.0, 0.0, 0.0},
                {-INFINITY, -36.0, -36.0}, {INFINITY, 0.0, 0.0},  {NAN, -18.0, -18.0}};
  for (const auto& row : writes) {
    SCOPED_TRACE(row.level);
    setUniformLevel(float(row.level));
    setLevelFor(float(row.level), ShotOrigin::eMP3Import);
    EXPECT_EQ(stored("AudioNormalisationUniformLevel"), row.uniform);
    EXPECT_EQ(stored("AudioNormalisationLevelFor_MP3Imports"), row.perKind);
    EXPECT_EQ(getUniformLevel(), float(row.uniform));
    EXPECT_EQ(getLevelFor(ShotOrigin::eMP3Import), float(row.perKind));
  }
  // Values stored by others are clamped when read.
  const struct {
    double stored, uniform, perKind;
  } reads[] = {{5.0, 0.0, 0.0},
               {-100.0, -36.0, -36.0},
               {999.0, 0.0, 999.0},
               {999.0000001, 0.0, 0.0},
               {NAN, -18.0, -18.0}};
  for (const auto& row : reads) {
    SCOPED_TRACE(row.stored);
    prefs().setPreference(String("AudioNormalisationUniformLevel"), row.stored);
    prefs().setPreference(String("AudioNormalisationLevelFor_CDImports"), row.stored);
    EXPECT_EQ(getUniformLevel(), float(row.uniform));
    EXPECT_EQ(getLevelFor(ShotOrigin::eCDImport), float(row.perKind));
  }
}

TEST_F(AudioPreferences, ChoicesOutsideOneToThreeReadAsThree) {
  for (int value : {-1, 0, 1, 2, 3, 4, 1 << 30}) {
    SCOPED_TRACE(value);
    const int expected = value >= 1 && value <= 3 ? value : 3;
    setApplicationMethod(Application(value));
    EXPECT_EQ(storedInt("AudioNormalisationApplicationMethod"), value);  // stored unchecked
    EXPECT_EQ(getApplicationMethod(), expected);
    setGroupingCondition(ShotOrigin::eCDImport, GroupingCondition::eGroupingCondition(value));
    EXPECT_EQ(storedInt("TrackGroupingConditionFor_CDImports"), value);
    EXPECT_EQ(getGroupingCondition(ShotOrigin::eCDImport), expected);
  }
  setEnabled(false);
  EXPECT_FALSE(getEnabled());
  EXPECT_FALSE(prefs().getPreference(String("TrackGroupingEnabled"), true));
}

TEST_F(AudioPreferences, GroupingConditionDisplayTexts) {
  EXPECT_EQ(getDisplayString(GroupingCondition::eSameSourceAndTimecode), L"Same source and timecode");
  EXPECT_EQ(getDisplayString(GroupingCondition::eAlways), L"Always");
  host::setResourceText(2451, L"Gleiche Quelle");
  EXPECT_EQ(getDisplayString(GroupingCondition::eSameSource), L"Gleiche Quelle");
  host::setResourceText(2451, L"Same source");
  for (int value : {0, 4, 2449})
    EXPECT_EQ(getDisplayString(GroupingCondition::eGroupingCondition(value)), L"");
}

}  // namespace
