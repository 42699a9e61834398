#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <tuple>
#include <vector>

#include "host/IniFile.h"
#include "host/StreamClassRegistry.h"
#include "mixer/MixStateTesting.h"
#include "tonebits/dsp/Aud__GainCurve.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

using Aud::SimpleMixState;
using mixtest::Bytes;
using mixtest::Dims;
using T = StreamableTraitsBase;

std::vector<uint8_t> packed(const SimpleMixState& s) {
  PStream stream;
  EXPECT_EQ(s.STRM_hierarchyPack(stream), T::ePacked);
  const auto bytes = stream.contents();
  return {bytes.begin(), bytes.end()};
}

// The layer data of a valid state, from its stored counts and uniform levels.
Bytes layerData(int ni, int nm, int no, float inputLevel, float mixLevel) {
  Bytes d;
  d.u8(1).u32(ni).u32(nm).u32(no);
  for (auto [n, v] : {std::pair{ni, inputLevel}, {ni, 0.5f}, {nm, mixLevel}}) {
    d.u32(n * 4);
    for (int k = 0; k < n; ++k) d.f32(v);
  }
  std::vector<uint8_t> toMix(nm * ni, 0), toOut(nm * no * 2, 0);
  for (int i = 0; i < ni && nm > 0; ++i) toMix[i * nm] = 1;
  if (nm > 0 && no > 2) toOut[2 * 2] = 1;
  if (nm > 0 && no > 3) toOut[3 * 2 + 1] = 1;
  d.block(toMix).block(toOut);
  for (int n : {ni, ni, nm, nm}) d.block(std::vector<uint8_t>(n, 0));
  return d;
}

Bytes chunk(const Bytes& data, const std::string& name = "AS", unsigned major = 1, unsigned minor = 1) {
  const auto n = static_cast<uint32_t>(data.size());
  return Bytes().header(name, major, minor, n, n).append(data);
}
Bytes framed(const Bytes& layerChunk) { return mixtest::baseChunks(layerChunk.size()).append(layerChunk); }

// A version-1 chunk header: revisions as one byte (or 255 and 16 bits),
// sizes as 16 bits (or 65535 and 32 bits).
Bytes v1Header(const std::string& name, unsigned major, unsigned minor, uint32_t own, uint32_t total) {
  Bytes b;
  b.record(name);
  for (unsigned rev : {major, minor}) rev < 255 ? b.u8(rev) : b.u8(255).u16(rev);
  for (uint32_t size : {own, total}) size < 65535 ? b.u16(size) : b.u16(65535).u32(size);
  return b;
}

struct Unpacked {
  T::eStatus status;
  std::unique_ptr<SimpleMixState> state;
  std::string message;
  int endOffset;  // position relative to the end of the data
};

Unpacked unpack(const Bytes& bytes, int formatVersion = 2) {
  PStream s(bytes.data.data(), bytes.size());
  s.formatVersion(formatVersion);
  Unpacked u;
  u.state.reset(static_cast<SimpleMixState*>(SimpleMixState(0, 0, 0).clone(Streamable::eBuildForUnpack)));
  u.status = u.state->STRM_hierarchyUnpack(s);
  u.message = s.messageText().c_str();
  u.endOffset = static_cast<int>(s.position()) - static_cast<int>(s.size());
  return u;
}

std::vector<std::string> lines(const KvIniFile& file, const char* section) {
  std::vector<std::string> out;
  for (const Kv::AttribValuePair& p : file[String(section)]) out.emplace_back(p.line().c_str());
  return out;
}

void retrieve(SimpleMixState& s, const std::string& text) {
  KvIniFile f;
  f.parse(text.c_str());
  s.retrieveCompatibleConfigurationInformation(f);
}

TEST(SimpleMixStateStream, PacksTheExactLayerBytes) {
  SimpleMixState s(2, 1, 2);
  const Bytes layer = Bytes().header("AS", 1, 1, 101, 101).append(layerData(2, 2, 4, 1.0f, 1.0f));
  EXPECT_EQ(packed(s), mixtest::baseChunks(layer.size(), s.tag()).append(layer).data);
  EXPECT_EQ(s.revisionMajor() * 10 + s.revisionMinor(), 11);
  // An invalid state packs to one zero.
  const SimpleMixState invalid;
  const Bytes zero = chunk(Bytes().u8(0));
  EXPECT_EQ(packed(invalid), mixtest::baseChunks(zero.size(), invalid.tag()).append(zero).data);
}

// Through a configuration file beside a section of someone else's (mutes
// and solos are not read back), then through an object stream bit for bit.
TEST(SimpleMixStatePersistence, RandomStatesRoundTrip) {
  std::mt19937 rng(2024);
  const std::string path = testing::TempDir() + "mixstate_ini_test.ini";
  const Dims sizes[] = {{0, 0, 0},  {1, 0, 0},  {0, 3, 1},    {2, 1, 2}, {5, 3, 7},
                        {13, 2, 1}, {17, 4, 9}, {64, 16, 32}, {3, 0, 1}};
  for (const Dims& n : sizes) {
    SCOPED_TRACE(testing::Message() << n.ni << "x" << n.nm << "x" << n.no);
    SimpleMixState s(n.ni, n.nm, n.no), back(n.ni, n.nm, n.no), defaults(n.ni, n.nm, n.no);
    mixtest::randomize(s, n, rng);
    KvIniFile f, loaded;
    EXPECT_EQ(s.storeCompatibleConfigurationInformation(f), Aud::sSuccess);
    f[String("Other")].emplace_back(String("keep=me"));
    ASSERT_TRUE(f.save(path.c_str()) && loaded.load(path.c_str()));
    ASSERT_EQ(back.retrieveCompatibleConfigurationInformation(loaded), Aud::sSuccess);
    EXPECT_TRUE(back.getDirty());
    mixtest::expectSameEntries(back, s, n, false, mixtest::kEverywhere, &defaults);
    EXPECT_EQ(lines(loaded, "Other"), std::vector<std::string>{"keep=me"});

    s.setInputPan(0, std::numeric_limits<float>::quiet_NaN());
    s.setInputPan(n.ni - 1, -0.0f);
    PStream stream;
    ASSERT_EQ(s.STRM_hierarchyPack(stream), T::ePacked);
    stream.position(0);
    std::unique_ptr<Streamable> built(SimpleMixState::STRM_L_SimpleMixState_builder(stream));
    ASSERT_NE(built, nullptr) << stream.messageText().c_str();
    EXPECT_TRUE(stream.messageText().isEmpty());
    EXPECT_EQ(stream.position(), stream.size());
    auto& r = static_cast<SimpleMixState&>(*built);
    EXPECT_FALSE(r.getDirty());
    EXPECT_EQ(r.revisionMajor() * 10 + r.revisionMinor(), 11);
    EXPECT_EQ(r.tag(), s.tag());
    mixtest::expectSameEntries(r, s, n);
    EXPECT_EQ(packed(r), packed(s));
  }
  std::remove(path.c_str());
}

TEST(SimpleMixStateStream, RevisionOneZeroLevelsAreMagnitudes) {
  // Revision minor, stored level, level read.
  const std::tuple<unsigned, float, float> rows[] = {{0, 0.5f, 0.8021483f}, {0, 1.0f, 1.0f},
                                                     {0, 2.0f, 1.245188f},  {0, 0.0f, 0.0f},
                                                     {1, 0.5f, 0.5f},       {1, 2.0f, 2.0f}};
  for (auto [minor, stored, level] : rows) {
    Unpacked u = unpack(framed(chunk(layerData(2, 2, 4, stored, stored), "AS", 1, minor)));
    ASSERT_EQ(u.status, T::eUnpacked) << u.message;
    EXPECT_FLOAT_EQ(u.state->getInputLevel(1), level) << stored;
    EXPECT_FLOAT_EQ(u.state->getMixLevel(0), level) << stored;
    EXPECT_EQ(u.state->getInputLevel(0),
              minor == 0 ? Aud::GainCurve::Curve<2>::mapMagnitudeToUValue(stored) : stored);
    EXPECT_EQ(u.state->getInputPan(0), 0.5f);  // pans are never converted
    EXPECT_EQ(u.state->revisionMinor(), minor);
  }
}

TEST(SimpleMixStateStream, RefusedDamagedAndForeignChunks) {
  const Bytes data = layerData(2, 2, 4, 1.0f, 1.0f);
  const auto n = static_cast<uint32_t>(data.size());
  const std::vector<uint8_t> tables(data.data.begin() + 13, data.data.end());
  Bytes shortBlock = data;
  shortBlock.data[13 + 36] = 3;  // input-to-mix block of 3 bytes instead of 4
  const Bytes foreign =
      Bytes().header("XY", 1, 1, n, n + 7).append(data).append(std::vector<uint8_t>(7, 0xEE));
  // The Taggable chunk claims 8 bytes of data but its reader takes 12.
  const Bytes as = chunk(data);
  Bytes tagOverread = Bytes().header("$", 2, 0, 0, static_cast<uint32_t>(24 + as.size()));
  tagOverread.header("TG", 1, 0, 8, static_cast<uint32_t>(8 + as.size())).u32(1).u32(2).u32(3).append(as);

  const std::string sizes =
      "Encountered invalid table sizes while unpacking SoftwareAudioMixer::SimpleMixState";
  const std::string newer =
      "Encountered unknown version of SoftwareAudioMixer::SimpleMixState (current v1.1, encountered v";
  const std::string end =
      "Unexpected end-of-file while unpacking Taggable.Aud__SimpleMixState, layer Aud__SimpleMixState.";
  const std::string overread =
      "Error: Unpacker read beyond end of chunk while unpacking object Taggable.Aud__SimpleMixState, layer "
      "Taggable v1.0, 4 bytes overread.\n";
  const std::string unknown = "Unrecognized version for Streamable base";
  struct Case {
    const char* what;
    Bytes stream;
    T::eStatus status;
    bool valid;
    std::string message;
    int formatVersion = 2;
    std::optional<int> endOffset = 0;  // none: not checked
    std::string printed = "";
  };
  const Case cases[] = {
      {"revision 1.2", framed(chunk(data, "AS", 1, 2)), T::eFailed, false, newer + "1.2)."},
      {"revision 2.0", framed(chunk(data, "AS", 2, 0)), T::eFailed, false, newer + "2.0)."},
      {"negative count", framed(chunk(Bytes().u8(1).u32(2).u32(~0u).u32(4).append(data))), T::eFailed, false,
       sizes},
      {"huge counts", framed(chunk(Bytes().u8(1).u32(0x7FFFFFFF).u32(0x7FFFFFFF).u32(0x7FFFFFFF))),
       T::eFailed, false, sizes},
      // The output table needs 4 bytes more than there are.
      {"tables beyond the layer", framed(chunk(Bytes().u8(1).u32(2).u32(2).u32(5).append(tables))),
       T::eFailed, false, sizes},
      {"routing block of the wrong size", framed(chunk(shortBlock)), T::eFailed, true,
       "Encountered unexpected binary data size while unpacking SoftwareAudioMixer::SimpleMixState"},
      // Refused before reading anything.
      {"own size short of the tables", framed(Bytes().header("AS", 1, 1, n - 2, n - 2).append(data)),
       T::eFailed, false, sizes, 2, -2},
      {"foreign chunk", framed(foreign), T::eWrongLayer, false,
       "Expected short name 'AS' for layer Aud__SimpleMixState, got XY."},
      {"long layer name", framed(chunk(data, "Aud__SimpleMixState")), T::eUnpacked, true, ""},
      {"header then end", framed(Bytes().header("AS", 1, 1, 101, 101)), T::eUnexpectedEnd, false, end},
      {"header cut short", framed(Bytes().record("AS").u8(1)), T::eUnexpectedEnd, false, end},
      {"no own data", framed(Bytes().header("AS", 1, 1, 0, 0)), T::eUnpacked, false, ""},
      {"an invalid state", framed(chunk(Bytes().u8(0))), T::eUnpacked, false, ""},
      {"data left unread", framed(chunk(Bytes().append(data).u16(0))), T::eUnpacked, true, "", 2, 0,
       "Warning: Not all object data was read while unpacking object Taggable.Aud__SimpleMixState, layer "
       "Aud__SimpleMixState v1.1, 2/103 bytes unread.\n"},
      // Sizes past the end of the data end at the end of the data.
      {"sizes beyond the data", framed(Bytes().header("AS", 1, 1, 0xFFFFFF00u, 0xFFFFFFF0u).append(data)),
       T::eUnpacked, true, ""},
      {"base layer read past its size", tagOverread, T::eFailed, false, overread, 2, std::nullopt},
      // Reads past the end of the data itself give zeros, and are seen.
      {"data ends inside the tag", Bytes().header("$", 2, 0, 0, 30).header("TG", 1, 0, 12, 12).u32(1).u32(2),
       T::eFailed, false, overread},
      // Version-1 revisions above 255, and unknown format versions.
      {"major 300", v1Header("AS", 300, 0, 0, 0), T::eFailed, false,
       " Strm1.0 Object has oversized major rev (AS). ", 1, std::nullopt},
      {"minor 256", v1Header("AS", 1, 256, 0, 0), T::eFailed, false,
       " Strm1.0 Object has oversized minor rev (AS). ", 1, std::nullopt},
      {"format 3", v1Header("AS", 1, 1, 0, 0), T::eFailed, false, unknown, 3, std::nullopt},
      {"format 0", v1Header("AS", 1, 1, 0, 0), T::eFailed, false, unknown, 0, std::nullopt},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    testing::internal::CaptureStdout();
    Unpacked u = unpack(c.stream, c.formatVersion);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), c.printed);
    EXPECT_EQ(u.status, c.status);
    EXPECT_EQ(u.state->valid(), c.valid);
    EXPECT_EQ(u.message, c.message);
    EXPECT_EQ(u.endOffset, c.endOffset.value_or(u.endOffset));
    // The builder gives up on 6 only.
    PStream again(c.stream.data.data(), c.stream.size());
    again.formatVersion(c.formatVersion);
    testing::internal::CaptureStdout();
    std::unique_ptr<Streamable> built(SimpleMixState::STRM_L_SimpleMixState_builder(again));
    testing::internal::GetCapturedStdout();
    EXPECT_EQ(built == nullptr, c.status == T::eFailed);
  }
}

TEST(SimpleMixStateStream, VersionOneHeadersUseVariableLengthNumbers) {
  // Large enough that the sizes need the escape.
  const int ni = 300, nm = 128, no = 150;
  const Bytes data = layerData(ni, nm, no, 0.5f, 1.0f);
  ASSERT_GT(data.size(), 65535u);
  const Bytes as = v1Header("AS", 1, 0, data.size(), data.size()).append(data);
  const Bytes tg =
      v1Header("TG", 1, 0, 12, static_cast<uint32_t>(12 + as.size())).u32(1).u32(2).u32(3).append(as);

  Unpacked u = unpack(v1Header("$", 1, 0, 0, static_cast<uint32_t>(tg.size())).append(tg), 1);
  ASSERT_EQ(u.status, T::eUnpacked) << u.message;
  EXPECT_EQ(u.endOffset, 0);
  EXPECT_EQ(u.state->tag(), IdStamp(1, 2, 3));
  EXPECT_FLOAT_EQ(u.state->getInputLevel(ni - 1), 0.8021483f);
  EXPECT_TRUE(u.state->getMixRoutedToOutput(-1, 1, false));

  // A root header naming version 1 switches a stream read as version 2, its
  // own sizes included.
  u = unpack(
      Bytes().record("$").u8(1).u8(0).u16(0).u16(65535).u32(static_cast<uint32_t>(tg.size())).append(tg));
  EXPECT_EQ(u.status, T::eUnpacked) << u.message;
  EXPECT_EQ(u.endOffset, 0);
}

// The names are the ones in the messages above; the registry knows both.
TEST(SimpleMixStateStream, Registration) {
  for (const char* name : {"TG.AS", "Taggable.Aud__SimpleMixState"})
    EXPECT_EQ(StreamClassRegistry::find(name), &SimpleMixState::STRM_L_SimpleMixState_builder);
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
  const std::pair<const char*, std::vector<std::string>> rows[] = {
      {"SimpleMixState", {"Version=1.1", "AuthorApp=Kelvane Editor", "AuthorAppVersion=11.1.0.0"}},
      {"SimpleMixState.InputChannels.Fader", {"000=1.0000000000", "001=0.2500000000"}},
      {"SimpleMixState.InputChannels.Pan", {"000=0.1250000000", "001=0.5000000000"}},
      {"SimpleMixState.InputChannels.Mute", {"000=0", "001=1"}},
      {"SimpleMixState.InputChannels.Solo", {"000=0", "001=0"}},
      {"SimpleMixState.InputChannels.RouteToMix", {"000->00=1", "000->01=0", "001->00=1", "001->01=0"}},
      {"SimpleMixState.MixChannels.Fader", {"00=1.0000000000", "01=1.0000000000"}},
      {"SimpleMixState.MixChannels.Mute", {"00=0", "01=0"}},
      {"SimpleMixState.MixChannels.Solo", {"01=1"}},
      {"SimpleMixState.MixChannels.RouteToOutput",
       {"00L->02=1", "00R->02=0", "00L->03=0", "00R->03=1", "01L->00=0", "01R->00=0", "01L->01=0",
        "01R->01=0", "01L->02=0", "01R->02=0", "01L->03=0", "01R->03=0"}},
  };
  for (const auto& [section, expected] : rows) EXPECT_EQ(lines(f, section), expected) << section;
  EXPECT_EQ(f.sectionNames().size(), std::size(rows));
}

// The version decides whether levels are magnitudes (those conversions are
// compared to about four units in the last place, the rest exactly; a later
// version line wins); values are clamped and scanned as the C library's
// runtime scans them.
TEST(SimpleMixStateIni, FaderValuesByVersion) {
  // Version line, input fader line, level.
  const std::tuple<std::string, const char*, float> rows[] = {
      {"Version=1.0", "000=0.5", 0.8021483f},
      {"version=1.0", "000=0.5", 0.8021483f},
      {"VERSION= 1.0", "000=0.5", 0.8021483f},
      {"Version=1.1\nVersion=1.0", "000=0.5", 0.8021483f},
      {"Version=1.0", "000=1.0", 1.0f},
      {"Version=1.0", "000=2.0", 1.245188f},
      {"Version=1.0", "000=9.0", 1.5f},
      {"Version=1.1", "000=0.5", 0.5f},
      {"Version=1", "000=0.5", 0.5f},
      {"Version=2.0", "000=0.5", 0.5f},
      {"", "000=0.5", 0.5f},
      {"", "000=3.0", 1.5f},
      {"", "000=-2", 0.0f},
      {"", "000= 0.25", 0.25f},
      {"", "000=+0.75", 0.75f},
      {"", "000=0.5junk", 0.5f},
      {"", "000=1e-60", 0.0f},
      {"", "000=1e60", 1.5f},
      {"", "0=0.125", 0.125f},
      {"", "000=.5", 0.5f}};
  for (const auto& [version, line, expected] : rows) {
    SCOPED_TRACE(testing::Message() << version << " " << line);
    SimpleMixState s(1, 1, 2);
    retrieve(s, "[SimpleMixState]\n" + version + "\n[SimpleMixState.InputChannels.Fader]\n" + line +
                    "\n[SimpleMixState.MixChannels.Fader]\n01" + std::strchr(line, '=') + "\n");
    for (float level : {s.getInputLevel(0), s.getMixLevel(0)})
      EXPECT_NEAR(level, expected, version.find("1.0") != std::string::npos ? 4.8e-7 : 0.0);
    EXPECT_EQ(s.getMixLevel(-1), 1.0f);
  }
}

// Keys out of range (4294967296 does not wrap to input 0) and malformed
// lines are not read.
TEST(SimpleMixStateIni, LinesThatDoNotFitAreIgnored) {
  const std::pair<const char*, std::vector<const char*>> rows[] = {
      {"InputChannels.Fader", {"007=0.3", "-01=0.3", "x=0.3", "000=abc", "4294967296=0.3", "000"}},
      {"InputChannels.Pan", {"004=0.3"}},
      {"InputChannels.RouteToMix", {"000->02=1", "000>01=1", "000->01=x"}},
      {"MixChannels.Fader", {"02=0.3"}},
      {"MixChannels.RouteToOutput",
       {"00L->01=1", "00R->00=1", "02X->03=1", "01X->03=1", "01L->04=1", "02L->03=1", "01L-03=1",
        "01L->03"}}};
  SimpleMixState defaults(4, 1, 2);
  for (const auto& [section, bad] : rows) {
    for (const char* line : bad) {
      SCOPED_TRACE(line);
      SimpleMixState s(4, 1, 2);
      retrieve(s, std::string("[SimpleMixState.") + section + "]\n" + line + "\n");
      mixtest::expectSameEntries(s, defaults, {4, 1, 2});
    }
  }
}

TEST(SimpleMixStateIni, RoutesApplyInFileOrderUnderTheOneFeedRule) {
  SimpleMixState s(1, 2, 2);
  retrieve(s,
           "[SimpleMixState.MixChannels.RouteToOutput]\n"
           "00L->02=1\n01R->02=1\n02L->02=1\n"  // the last "1" for output 0 wins
           "01L->00=1\n02L->00=1\n"             // a pseudo output takes many feeds
           "00R->03=0\n");
  EXPECT_TRUE(s.getMixRoutedToOutput(1, 0, true) && s.getMixRoutedToOutput(0, -2, true) &&
              s.getMixRoutedToOutput(1, -2, true));
  EXPECT_FALSE(s.getMixRoutedToOutput(0, 0, false) || s.getMixRoutedToOutput(-1, 0, true) ||
               s.getMixRoutedToOutput(-1, 1, false));
}

TEST(SimpleMixStateIni, AFileFromALargerOrSmallerMixerLoadsWhatFits) {
  std::mt19937 rng(31);
  const std::pair<Dims, Dims> pairs[] = {
      {{6, 3, 6}, {3, 1, 2}}, {{2, 1, 2}, {5, 3, 4}}, {{4, 0, 3}, {2, 2, 1}}};
  for (const auto& [from, to] : pairs) {
    SCOPED_TRACE(testing::Message() << "into " << to.ni << "x" << to.nm << "x" << to.no);
    SimpleMixState writer(from.ni, from.nm, from.no), reader(to.ni, to.nm, to.no),
        defaults(to.ni, to.nm, to.no);
    mixtest::randomize(writer, from, rng);
    KvIniFile f;
    writer.storeCompatibleConfigurationInformation(f);
    reader.retrieveCompatibleConfigurationInformation(f);
    mixtest::expectSameEntries(reader, writer, to, false, from, &defaults);
  }
}

}  // namespace
