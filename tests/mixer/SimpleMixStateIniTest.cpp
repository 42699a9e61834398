#include <gtest/gtest.h>

#include <cstdio>
#include <random>
#include <string>
#include <vector>

#include "host/IniFile.h"
#include "mixer/MixStateTesting.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

using Aud::SimpleMixState;

std::vector<std::string> lines(const KvIniFile& file, const char* section) {
  std::vector<std::string> out;
  for (const Kv::AttribValuePair& p : file[String(section)]) out.emplace_back(p.line().c_str());
  return out;
}

KvIniFile iniFrom(const char* text) {
  KvIniFile f;
  f.parse(text);
  return f;
}

TEST(SimpleMixStateIni, StoresTheExactLinesInLoopOrder) {
  SimpleMixState s(2, 1, 2);
  s.setInputLevel(1, 0.25f);
  s.setInputPan(0, 0.125f);
  s.setInputMuteState(1, true);
  s.setMixSoloState(0, true);
  KvIniFile f;
  ASSERT_EQ(s.storeCompatibleConfigurationInformation(f), Aud::sSuccess);
  ASSERT_EQ(s.storeCompatibleConfigurationInformation(f), Aud::sSuccess);  // sections are emptied first
  using V = std::vector<std::string>;
  struct Row {
    const char* section;
    V expected;
  };
  const Row rows[] = {
      {"SimpleMixState", V{"Version=1.1", "AuthorApp=Kelvane Editor", "AuthorAppVersion=11.1.0.0"}},
      {"SimpleMixState.InputChannels.Fader", V{"000=1.0000000000", "001=0.2500000000"}},
      {"SimpleMixState.InputChannels.Pan", V{"000=0.1250000000", "001=0.5000000000"}},
      {"SimpleMixState.InputChannels.Mute", V{"000=0", "001=1"}},
      {"SimpleMixState.InputChannels.Solo", V{"000=0", "001=0"}},
      {"SimpleMixState.InputChannels.RouteToMix", V{"000->00=1", "000->01=0", "001->00=1", "001->01=0"}},
      {"SimpleMixState.MixChannels.Fader", V{"00=1.0000000000", "01=1.0000000000"}},
      {"SimpleMixState.MixChannels.Mute", V{"00=0", "01=0"}},
      {"SimpleMixState.MixChannels.Solo", V{"01=1"}},
      {"SimpleMixState.MixChannels.RouteToOutput",
       V{"00L->02=1", "00R->02=0", "00L->03=0", "00R->03=1", "01L->00=0", "01R->00=0", "01L->01=0",
         "01R->01=0", "01L->02=0", "01R->02=0", "01L->03=0", "01R->03=0"}},
  };
  for (const Row& r : rows) EXPECT_EQ(lines(f, r.section), r.expected) << r.section;
  EXPECT_EQ(f.sectionNames().size(), std::size(rows));
}

TEST(SimpleMixStateIni, StoreThenRetrieveRoundTripsRandomStates) {
  std::mt19937 rng(77);
  const int sizes[][3] = {{0, 0, 0}, {1, 0, 0}, {2, 1, 2}, {5, 3, 7}, {13, 2, 1}, {64, 16, 32}};
  for (const auto& n : sizes) {
    SCOPED_TRACE(testing::Message() << n[0] << "x" << n[1] << "x" << n[2]);
    SimpleMixState s(n[0], n[1], n[2]), back(n[0], n[1], n[2]);
    mixtest::randomize(s, n[0], n[1], n[2], rng);
    KvIniFile f;
    s.storeCompatibleConfigurationInformation(f);
    // Through the text form, as a file holds it.
    KvIniFile reread = iniFrom(f.text().c_str());
    EXPECT_FALSE(back.getDirty());
    ASSERT_EQ(back.retrieveCompatibleConfigurationInformation(reread), Aud::sSuccess);
    EXPECT_TRUE(back.getDirty());
    mixtest::expectSameEntries(back, s, n[0], n[1], n[2], /*muteSolo=*/false);
    for (int i = 0; i < n[0]; ++i) EXPECT_FALSE(back.getInputMuteState(i) || back.getInputSoloState(i));
    for (int m = -1; m < n[1]; ++m) EXPECT_FALSE(back.getMixMuteState(m) || back.getMixSoloState(m));
  }
}

TEST(SimpleMixStateIni, VersionDecidesWhetherLevelsAreMagnitudes) {
  struct Row {
    const char* version;
    const char* input;
    float level;
  };
  const Row rows[] = {
      {"Version=1.0", "000=0.5", 0.8021483f},
      {"Version=1.1", "000=0.5", 0.5f},
      {"version=1.0", "000=0.5", 0.8021483f},
      {"VERSION= 1.0", "000=0.5", 0.8021483f},
      {"Version=1", "000=0.5", 0.5f},
      {"Version=2.0", "000=0.5", 0.5f},
      {"", "000=0.5", 0.5f},
      {"Version=1.0", "000=1.0", 1.0f},
      {"Version=1.0", "000=2.0", 1.245188f},
      {"Version=1.0", "000=9.0", 1.5f},
  };
  for (const Row& r : rows) {
    const std::string text = std::string("[SimpleMixState]\n") + r.version +
                             "\n[SimpleMixState.InputChannels.Fader]\n" + r.input +
                             "\n[SimpleMixState.MixChannels.Fader]\n" + "01=" + (r.input + 4) + "\n";
    SimpleMixState s(1, 1, 2);
    s.retrieveCompatibleConfigurationInformation(iniFrom(text.c_str()));
    EXPECT_FLOAT_EQ(s.getInputLevel(0), r.level) << r.version << " " << r.input;
    EXPECT_FLOAT_EQ(s.getMixLevel(0), r.level) << r.version << " " << r.input;
    EXPECT_EQ(s.getMixLevel(-1), 1.0f);
  }
  // A later version line overrides an earlier one.
  SimpleMixState s(1, 0, 2);
  s.retrieveCompatibleConfigurationInformation(
      iniFrom("[SimpleMixState]\nVersion=1.1\nVersion=1.0\n[SimpleMixState.InputChannels.Fader]\n000=0.5\n"));
  EXPECT_FLOAT_EQ(s.getInputLevel(0), 0.8021483f);
}

TEST(SimpleMixStateIni, LinesThatDoNotFitAreIgnored) {
  struct Row {
    const char* section;
    const char* line;
  };
  const Row rows[] = {
      {"SimpleMixState.InputChannels.Fader", "007=0.3"},
      {"SimpleMixState.InputChannels.Fader", "-01=0.3"},
      {"SimpleMixState.InputChannels.Fader", "x=0.3"},
      {"SimpleMixState.InputChannels.Fader", "000=abc"},
      {"SimpleMixState.InputChannels.Fader", "4294967296=0.3"},  // does not wrap to input 0
      {"SimpleMixState.InputChannels.Fader", "000"},
      {"SimpleMixState.InputChannels.Pan", "004=0.3"},
      {"SimpleMixState.InputChannels.RouteToMix", "000->02=1"},
      {"SimpleMixState.InputChannels.RouteToMix", "000>01=1"},
      {"SimpleMixState.InputChannels.RouteToMix", "000->01=x"},
      {"SimpleMixState.MixChannels.Fader", "02=0.3"},
      {"SimpleMixState.MixChannels.RouteToOutput", "00L->01=1"},
      {"SimpleMixState.MixChannels.RouteToOutput", "00R->00=1"},
      {"SimpleMixState.MixChannels.RouteToOutput", "02X->03=1"},
      {"SimpleMixState.MixChannels.RouteToOutput", "01X->03=1"},
      {"SimpleMixState.MixChannels.RouteToOutput", "01L->04=1"},
      {"SimpleMixState.MixChannels.RouteToOutput", "02L->03=1"},
      {"SimpleMixState.MixChannels.RouteToOutput", "01L-03=1"},
      {"SimpleMixState.MixChannels.RouteToOutput", "01L->03"},
      {"SimpleMixState.InputChannels.Mute", "000=1"},
      {"SimpleMixState.MixChannels.Solo", "01=1"},
  };
  SimpleMixState defaults(4, 1, 2);
  for (const Row& r : rows) {
    const std::string text = std::string("[") + r.section + "]\n" + r.line + "\n";
    SimpleMixState s(4, 1, 2);
    s.retrieveCompatibleConfigurationInformation(iniFrom(text.c_str()));
    SCOPED_TRACE(r.line);
    mixtest::expectSameEntries(s, defaults, 4, 1, 2);
  }
}

TEST(SimpleMixStateIni, ValuesAreClampedAndScannedLikeTheRuntime) {
  struct Row {
    const char* line;
    float level;
  };
  const Row rows[] = {{"000=3.0", 1.5f},     {"000=-2", 0.0f},    {"000= 0.25", 0.25f}, {"000=+0.75", 0.75f},
                      {"000=0.5junk", 0.5f}, {"000=1e-60", 0.0f}, {"000=1e60", 1.5f},   {"0=0.125", 0.125f},
                      {"000=.5", 0.5f},      {"000=-1e-60", 0.0f}};
  for (const Row& r : rows) {
    SimpleMixState s(1, 0, 2);
    s.retrieveCompatibleConfigurationInformation(
        iniFrom((std::string("[SimpleMixState.InputChannels.Fader]\n") + r.line + "\n").c_str()));
    EXPECT_EQ(s.getInputLevel(0), r.level) << r.line;
  }
}

TEST(SimpleMixStateIni, RoutesApplyInFileOrderUnderTheOneFeedRule) {
  SimpleMixState s(1, 2, 2);
  s.retrieveCompatibleConfigurationInformation(
      iniFrom("[SimpleMixState.MixChannels.RouteToOutput]\n"
              "00L->02=1\n01R->02=1\n02L->02=1\n"  // the last "1" for output 0 wins
              "01L->00=1\n02L->00=1\n"             // a pseudo output takes many feeds
              "00R->03=0\n"));
  EXPECT_TRUE(s.getMixRoutedToOutput(1, 0, true));
  EXPECT_FALSE(s.getMixRoutedToOutput(0, 0, false));
  EXPECT_FALSE(s.getMixRoutedToOutput(-1, 0, true));
  EXPECT_TRUE(s.getMixRoutedToOutput(0, -2, true));
  EXPECT_TRUE(s.getMixRoutedToOutput(1, -2, true));
  EXPECT_FALSE(s.getMixRoutedToOutput(-1, 1, false));
}

TEST(SimpleMixStateIni, AFileFromALargerOrSmallerMixerLoadsWhatFits) {
  std::mt19937 rng(31);
  struct Sizes {
    int ni, nm, no;
  };
  const std::pair<Sizes, Sizes> pairs[] = {
      {{6, 3, 6}, {3, 1, 2}}, {{2, 1, 2}, {5, 3, 4}}, {{4, 0, 3}, {2, 2, 1}}};
  for (const auto& [from, to] : pairs) {
    SCOPED_TRACE(testing::Message() << from.ni << "x" << from.nm << "x" << from.no << " into " << to.ni << "x"
                                    << to.nm << "x" << to.no);
    SimpleMixState writer(from.ni, from.nm, from.no), reader(to.ni, to.nm, to.no),
        defaults(to.ni, to.nm, to.no);
    mixtest::randomize(writer, from.ni, from.nm, from.no, rng);
    KvIniFile f;
    writer.storeCompatibleConfigurationInformation(f);
    reader.retrieveCompatibleConfigurationInformation(f);
    for (int i = 0; i < to.ni; ++i) {
      SimpleMixState& ref = i < from.ni ? writer : defaults;
      EXPECT_EQ(reader.getInputLevel(i), ref.getInputLevel(i)) << i;
      EXPECT_EQ(reader.getInputPan(i), ref.getInputPan(i)) << i;
      for (int m = -1; m < to.nm; ++m) {
        SimpleMixState& r2 = (i < from.ni && m < from.nm) ? writer : defaults;
        EXPECT_EQ(reader.getInputRoutedToMix(i, m), r2.getInputRoutedToMix(i, m)) << i << "," << m;
      }
    }
    for (int m = -1; m < to.nm; ++m) {
      EXPECT_EQ(reader.getMixLevel(m), (m < from.nm ? writer : defaults).getMixLevel(m)) << m;
      // Pseudo outputs are not exclusive, so the file's entries are exact;
      // physical outputs may also have lost a default feed to a file's "1".
      for (int o = -2; o < 0 && m >= 0; ++o) {
        SimpleMixState& r2 = (m < from.nm && o < from.no) ? writer : defaults;
        EXPECT_EQ(reader.getMixRoutedToOutput(m, o, true), r2.getMixRoutedToOutput(m, o, true))
            << m << "," << o;
      }
      for (int o = 0; o < std::min(from.no, to.no); ++o) {
        if (m >= from.nm) continue;
        for (bool left : {true, false}) {
          if (writer.getMixRoutedToOutput(m, o, left)) {
            // A route in the file and in range is set (the one-feed rule
            // leaves the writer's own routes consistent).
            EXPECT_TRUE(reader.getMixRoutedToOutput(m, o, left)) << m << "," << o;
          }
        }
      }
    }
  }
}

TEST(SimpleMixStateIni, SavedToAndLoadedFromARealFile) {
  std::mt19937 rng(5);
  SimpleMixState s(6, 2, 4), back(6, 2, 4);
  mixtest::randomize(s, 6, 2, 4, rng);
  KvIniFile f;
  s.storeCompatibleConfigurationInformation(f);
  f[String("Other")].emplace_back(String("keep=me"));
  const std::string path = testing::TempDir() + "mixstate_ini_test.ini";
  ASSERT_TRUE(f.save(path.c_str()));
  KvIniFile loaded;
  ASSERT_TRUE(loaded.load(path.c_str()));
  back.retrieveCompatibleConfigurationInformation(loaded);
  mixtest::expectSameEntries(back, s, 6, 2, 4, false);
  ASSERT_EQ(loaded[String("Other")].size(), 1u);
  EXPECT_STREQ(loaded[String("Other")][0].value().c_str(), "me");
  std::remove(path.c_str());
}

TEST(SimpleMixStateIni, AnInvalidStateIsReportedAndLeftAlone) {
  mixtest::FatalReports reports;
  SimpleMixState s;
  KvIniFile f;
  EXPECT_EQ(s.storeCompatibleConfigurationInformation(f), Aud::sSuccess);
  EXPECT_EQ(s.retrieveCompatibleConfigurationInformation(f), Aud::sSuccess);
  EXPECT_EQ(reports.messages, (std::vector<std::string>{"Function called on invalid MixerState!",
                                                        "Function called on invalid MixerState!"}));
  EXPECT_TRUE(f.sectionNames().empty());
  EXPECT_FALSE(s.getDirty());
}

}  // namespace
