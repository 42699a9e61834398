// The editor's audio import preferences, kept in the host's preference store
// (prefs()): how imported audio is level-normalised and to what level, and
// whether and how the tracks of imported material are grouped, in total or
// per kind of import. Every call reads or writes the store at that moment;
// nothing is cached.
//
// Keys (a kind's key word is appended where a key ends in '_'):
//   "AudioNormalisationApplicationMethod"   int     3
//   "AudioNormalisationUniformLevel"        double  -18.0 dB
//   "AudioNormalisationLevelFor_"           double  -18.0 dB
//   "TrackGroupingEnabled"                  bool    true
//   "TrackGroupingConditionFor_"            int     3
//
// Levels are -36.0 to 0.0 dB inclusive; reads and writes clamp to that range.
// The per-kind level also takes the invalid level 999.0, unclamped. A NaN
// level, read or written, stands for the default of -18.0 dB.
#pragma once

#include <cstdint>

#include "host/String.h"
#include "tonebits/export.h"

namespace ShotOrigin {
// The kinds of import; each has its own key word. Other values add nothing
// to a key.
enum eShotOrigin : int32_t {
  eUnknownOrigin = 0,
  eStereoWavImport = 1,             // "StereoWavImports"
  eMultiTrackWavImport = 2,         // "MultiTrackWavImports"
  eRecordingWithVideo = 3,          // "RecordingsWithVideo"
  eAudioOnlyRecording = 4,          // "AudioOnlyRecordings"
  eMP3Import = 5,                   // "MP3Imports"
  eCDImport = 6,                    // "CDImports"
  eOtherStereoAudioImport = 7,      // "OtherStereoAudioImports"
  eOtherMultiTrackAudioImport = 8,  // "OtherMultiTrackAudioImports"
};
}  // namespace ShotOrigin

namespace AudioNormalisation {

enum Application : int32_t {
  eNoNormalisation = 1,
  eUniformLevel = 2,    // every import to getUniformLevel()
  eLevelPerOrigin = 3,  // each kind of import to its getLevelFor()
};

// The stored method if it is 1, 2 or 3; otherwise 3.
TONEBITS_API Application getApplicationMethod();
// Stored as given, unchecked.
TONEBITS_API void setApplicationMethod(Application method);

TONEBITS_API float getUniformLevel();
TONEBITS_API void setUniformLevel(float level);

// 999.0: "no level", passed through by the per-kind level unclamped.
TONEBITS_API float invalidAudioNormalLevel();
TONEBITS_API float getLevelFor(ShotOrigin::eShotOrigin origin);
TONEBITS_API void setLevelFor(float level, ShotOrigin::eShotOrigin origin);

}  // namespace AudioNormalisation

namespace AudioTrackGrouping {

namespace GroupingCondition {
enum eGroupingCondition : int32_t {
  eSameSourceAndTimecode = 1,
  eSameSource = 2,
  eAlways = 3,
};
}  // namespace GroupingCondition

TONEBITS_API bool getEnabled();
TONEBITS_API void setEnabled(bool enabled);
// The stored condition if it is 1, 2 or 3; otherwise 3.
TONEBITS_API GroupingCondition::eGroupingCondition getGroupingCondition(ShotOrigin::eShotOrigin origin);
// Stored as given, unchecked.
TONEBITS_API void setGroupingCondition(ShotOrigin::eShotOrigin origin,
                                       GroupingCondition::eGroupingCondition condition);

}  // namespace AudioTrackGrouping

// The condition's host resource text; empty for values other than 1 to 3.
TONEBITS_API WString getDisplayString(AudioTrackGrouping::GroupingCondition::eGroupingCondition condition);

// Input channels the editor records at once: 4.
TONEBITS_API int audio_get_record_channels();
// Playback locks to the word clock: true.
TONEBITS_API bool audio_playback_lock_to_word_clock();
