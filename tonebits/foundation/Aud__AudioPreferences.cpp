#include "tonebits/foundation/Aud__AudioPreferences.h"

#include "host/Config.h"
#include "host/Resources.h"

namespace {

constexpr double kMinLevel = -36.0;
constexpr double kMaxLevel = 0.0;
constexpr double kDefaultLevel = -18.0;
constexpr double kInvalidLevel = 999.0;
constexpr int kDefaultChoice = 3;

const char* keyWord(ShotOrigin::eShotOrigin origin) noexcept {
  static constexpr const char* kWords[] = {
      "",
      "StereoWavImports",
      "MultiTrackWavImports",
      "RecordingsWithVideo",
      "AudioOnlyRecordings",
      "MP3Imports",
      "CDImports",
      "OtherStereoAudioImports",
      "OtherMultiTrackAudioImports",
  };
  const auto index = static_cast<uint32_t>(origin);
  return index < sizeof(kWords) / sizeof(kWords[0]) ? kWords[index] : "";
}

String levelKey(ShotOrigin::eShotOrigin origin) {
  return String("AudioNormalisationLevelFor_") + keyWord(origin);
}
String groupingKey(ShotOrigin::eShotOrigin origin) {
  return String("TrackGroupingConditionFor_") + keyWord(origin);
}

// A NaN is no level at all; it is read and written as the default so that a
// gain computed from it stays finite.
double clampLevel(double level) noexcept {
  if (level != level) return kDefaultLevel;
  return level > kMaxLevel ? kMaxLevel : level < kMinLevel ? kMinLevel : level;
}

double clampLevelOrInvalid(double level) noexcept {
  return level == kInvalidLevel ? level : clampLevel(level);
}

int oneOfThree(int value) noexcept { return value >= 1 && value <= 3 ? value : kDefaultChoice; }

}  // namespace

namespace AudioNormalisation {

Application getApplicationMethod() {
  return Application(
      oneOfThree(prefs().getPreference("AudioNormalisationApplicationMethod", kDefaultChoice)));
}

void setApplicationMethod(Application method) {
  prefs().setPreference("AudioNormalisationApplicationMethod", static_cast<int>(method));
}

float getUniformLevel() {
  return static_cast<float>(
      clampLevel(prefs().getPreference("AudioNormalisationUniformLevel", kDefaultLevel)));
}

void setUniformLevel(float level) {
  prefs().setPreference("AudioNormalisationUniformLevel", clampLevel(level));
}

float invalidAudioNormalLevel() { return static_cast<float>(kInvalidLevel); }

float getLevelFor(ShotOrigin::eShotOrigin origin) {
  return static_cast<float>(clampLevelOrInvalid(prefs().getPreference(levelKey(origin), kDefaultLevel)));
}

void setLevelFor(float level, ShotOrigin::eShotOrigin origin) {
  prefs().setPreference(levelKey(origin), clampLevelOrInvalid(level));
}

}  // namespace AudioNormalisation

namespace AudioTrackGrouping {

bool getEnabled() { return prefs().getPreference("TrackGroupingEnabled", true); }
void setEnabled(bool enabled) { prefs().setPreference("TrackGroupingEnabled", enabled); }

GroupingCondition::eGroupingCondition getGroupingCondition(ShotOrigin::eShotOrigin origin) {
  return GroupingCondition::eGroupingCondition(
      oneOfThree(prefs().getPreference(groupingKey(origin), kDefaultChoice)));
}

void setGroupingCondition(ShotOrigin::eShotOrigin origin, GroupingCondition::eGroupingCondition condition) {
  prefs().setPreference(groupingKey(origin), static_cast<int>(condition));
}

}  // namespace AudioTrackGrouping

WString getDisplayString(AudioTrackGrouping::GroupingCondition::eGroupingCondition condition) {
  if (condition < 1 || condition > 3) return WString();
  return resourceStrW(2449 + static_cast<int>(condition), 0);
}

int audio_get_record_channels() { return 4; }
bool audio_playback_lock_to_word_clock() { return true; }
