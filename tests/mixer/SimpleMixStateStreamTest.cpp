#include <gtest/gtest.h>

#include <memory>
#include <random>
#include <string>

#include "host/StreamClassRegistry.h"
#include "mixer/MixStateTesting.h"
#include "tonebits/dsp/Aud__GainCurve.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

using Aud::SimpleMixState;
using mixtest::Bytes;
using Status = StreamableTraitsBase::eStatus;

std::vector<uint8_t> packed(const SimpleMixState& s) {
  PStream stream;
  EXPECT_EQ(s.STRM_hierarchyPack(stream), StreamableTraitsBase::ePacked);
  const auto bytes = stream.contents();
  return {bytes.begin(), bytes.end()};
}

// The layer data of a valid state, from its user counts and uniform values.
Bytes layerData(int ni, int nm, int no, float inputLevel, float mixLevel) {
  Bytes d;
  d.u8(1).u32(ni).u32(nm).u32(no);
  d.u32(ni * 4);
  for (int i = 0; i < ni; ++i) d.f32(inputLevel);
  d.u32(ni * 4);
  for (int i = 0; i < ni; ++i) d.f32(0.5f);
  d.u32(nm * 4);
  for (int m = 0; m < nm; ++m) d.f32(mixLevel);
  std::vector<uint8_t> toMix(nm * ni, 0), toOut(nm * no * 2, 0);
  for (int i = 0; i < ni && nm > 0; ++i) toMix[i * nm] = 1;
  if (nm > 0 && no > 2) toOut[2 * 2] = 1;
  if (nm > 0 && no > 3) toOut[3 * 2 + 1] = 1;
  d.block(toMix).block(toOut);
  for (int n : {ni, ni, nm, nm}) {
    d.u32(n);
    for (int k = 0; k < n; ++k) d.u8(0);
  }
  return d;
}

// A whole stream: the base chunks, then an "AS" chunk of the given header
// fields around data.
Bytes streamWith(const Bytes& data, const std::string& name = "AS", unsigned major = 1, unsigned minor = 1) {
  Bytes chunk;
  chunk.header(name, major, minor, static_cast<uint32_t>(data.size()), static_cast<uint32_t>(data.size()))
      .append(data);
  return mixtest::baseChunks(chunk.size()).append(chunk);
}

struct Unpacked {
  Status status;
  std::unique_ptr<SimpleMixState> state;
  std::string message;
  unsigned position;
  unsigned size;
};

Unpacked unpack(const Bytes& bytes, int formatVersion = 2) {
  PStream s(bytes.data.data(), bytes.size());
  s.formatVersion(formatVersion);
  Unpacked u;
  u.state.reset(static_cast<SimpleMixState*>(SimpleMixState(0, 0, 0).clone(Streamable::eBuildForUnpack)));
  u.status = u.state->STRM_hierarchyUnpack(s);
  u.message = s.messageText().c_str();
  u.position = s.position();
  u.size = s.size();
  return u;
}

TEST(SimpleMixStateStream, PacksTheExactLayerBytes) {
  SimpleMixState s(2, 1, 2);
  const Bytes data = layerData(2, 2, 4, 1.0f, 1.0f);
  ASSERT_EQ(data.size(), 1u + 3 * 4 + (4 + 8) + (4 + 8) + (4 + 8) + (4 + 4) + (4 + 16) + 4 * (4 + 2));
  Bytes chunk;
  chunk.header("AS", 1, 1, 101, 101).append(data);
  const Bytes expected = mixtest::baseChunks(chunk.size(), s.tag()).append(chunk);
  EXPECT_EQ(packed(s), expected.data);
  EXPECT_EQ(s.revisionMajor(), 1);
  EXPECT_EQ(s.revisionMinor(), 1);
}

TEST(SimpleMixStateStream, AnInvalidStatePacksToOneZeroAndReadsBackInvalid) {
  SimpleMixState s;
  Bytes data;
  data.u8(0);
  const Bytes expected = streamWith(data);
  // The tag of a default-made state is fresh: compare past it.
  const auto bytes = packed(s);
  ASSERT_EQ(bytes.size(), expected.size());
  EXPECT_TRUE(std::equal(bytes.end() - 17, bytes.end(), expected.data.end() - 17));
  Unpacked u = unpack(expected);
  EXPECT_EQ(u.status, StreamableTraitsBase::eUnpacked);
  EXPECT_FALSE(u.state->valid());
  EXPECT_TRUE(u.message.empty());
}

TEST(SimpleMixStateStream, RoundTripsRandomStatesOfManySizes) {
  std::mt19937 rng(2024);
  const int sizes[][3] = {{0, 0, 0}, {1, 0, 0},  {0, 3, 1},    {2, 1, 2},
                          {5, 3, 7}, {17, 4, 9}, {64, 16, 32}, {3, 0, 1}};
  for (const auto& n : sizes) {
    SCOPED_TRACE(testing::Message() << n[0] << "x" << n[1] << "x" << n[2]);
    SimpleMixState s(n[0], n[1], n[2]);
    mixtest::randomize(s, n[0], n[1], n[2], rng);
    s.setInputPan(0, std::numeric_limits<float>::quiet_NaN());
    s.setInputPan(n[0] - 1, -0.0f);
    ASSERT_TRUE(s.getDirty());
    PStream stream;
    ASSERT_EQ(s.STRM_hierarchyPack(stream), StreamableTraitsBase::ePacked);
    stream.position(0);
    std::unique_ptr<Streamable> built(SimpleMixState::STRM_L_SimpleMixState_builder(stream));
    ASSERT_NE(built, nullptr) << stream.messageText().c_str();
    EXPECT_TRUE(stream.messageText().isEmpty());
    EXPECT_EQ(stream.position(), stream.size());
    auto& r = static_cast<SimpleMixState&>(*built);
    EXPECT_TRUE(r.valid());
    EXPECT_FALSE(r.getDirty());
    EXPECT_EQ(r.revisionMajor(), 1);
    EXPECT_EQ(r.revisionMinor(), 1);
    EXPECT_EQ(r.tag(), s.tag());
    mixtest::expectSameEntries(r, s, n[0], n[1], n[2]);
    EXPECT_EQ(packed(r), packed(s));
  }
}

TEST(SimpleMixStateStream, RevisionOneZeroLevelsAreMagnitudes) {
  struct Row {
    unsigned minor;
    float stored, level;
  };
  const Row rows[] = {{0, 0.5f, 0.8021483f}, {0, 1.0f, 1.0f}, {0, 2.0f, 1.245188f},
                      {0, 0.0f, 0.0f},       {1, 0.5f, 0.5f}, {1, 2.0f, 2.0f}};
  for (const Row& r : rows) {
    Unpacked u = unpack(streamWith(layerData(2, 2, 4, r.stored, r.stored), "AS", 1, r.minor));
    ASSERT_EQ(u.status, StreamableTraitsBase::eUnpacked) << u.message;
    EXPECT_FLOAT_EQ(u.state->getInputLevel(1), r.level) << r.stored;
    EXPECT_FLOAT_EQ(u.state->getMixLevel(0), r.level) << r.stored;
    EXPECT_EQ(u.state->getInputLevel(0),
              Aud::GainCurve::Curve<2>::mapMagnitudeToUValue(r.stored) * (r.minor == 0) +
                  r.stored * (r.minor == 1));
    EXPECT_EQ(u.state->getInputPan(0), 0.5f);  // pans are never converted
    EXPECT_EQ(u.state->revisionMinor(), r.minor);
    EXPECT_FALSE(u.state->getDirty());
  }
}

TEST(SimpleMixStateStream, RefusedAndDamagedLayers) {
  const Bytes good = layerData(2, 2, 4, 1.0f, 1.0f);
  Bytes negative;
  negative.u8(1).u32(2).u32(static_cast<uint32_t>(-1)).u32(4).append(good);
  Bytes hugeCounts;
  hugeCounts.u8(1).u32(0x7FFFFFFF).u32(0x7FFFFFFF).u32(0x7FFFFFFF);
  Bytes tooBigForLayer;
  tooBigForLayer.u8(1).u32(2).u32(2).u32(5);  // the output table needs 4 bytes more than there are
  tooBigForLayer.data.insert(tooBigForLayer.data.end(), good.data.begin() + 13, good.data.end());
  Bytes shortBlock = layerData(2, 2, 4, 1.0f, 1.0f);
  shortBlock.data[13 + 36 + 0] = 3;  // input-to-mix block of 3 bytes instead of 4
  struct Case {
    const char* what;
    Bytes data;
    unsigned major, minor;
    std::string message;
  };
  const std::string sizes =
      "Encountered invalid table sizes while unpacking SoftwareAudioMixer::SimpleMixState";
  const Case cases[] = {
      {"revision 1.2", good, 1, 2,
       "Encountered unknown version of SoftwareAudioMixer::SimpleMixState (current v1.1, encountered v1.2)."},
      {"revision 2.0", good, 2, 0,
       "Encountered unknown version of SoftwareAudioMixer::SimpleMixState (current v1.1, encountered v2.0)."},
      {"negative count", negative, 1, 1, sizes},
      {"huge counts", hugeCounts, 1, 1, sizes},
      {"tables beyond the layer", tooBigForLayer, 1, 1, sizes},
      {"routing block of the wrong size", shortBlock, 1, 1,
       "Encountered unexpected binary data size while unpacking SoftwareAudioMixer::SimpleMixState"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    const Bytes stream = streamWith(c.data, "AS", c.major, c.minor);
    Unpacked u = unpack(stream);
    EXPECT_EQ(u.status, StreamableTraitsBase::eFailed);
    EXPECT_EQ(u.message, c.message);
    EXPECT_EQ(u.position, u.size);  // at the end of the whole chunk
    if (c.message !=
        "Encountered unexpected binary data size while unpacking SoftwareAudioMixer::SimpleMixState") {
      EXPECT_FALSE(u.state->valid());
    }
    PStream s(stream.data.data(), stream.size());
    EXPECT_EQ(SimpleMixState::STRM_L_SimpleMixState_builder(s), nullptr);
  }
}

TEST(SimpleMixStateStream, ChunkFrameResults) {
  const Bytes data = layerData(2, 2, 4, 1.0f, 1.0f);
  Bytes foreign;
  foreign.header("XY", 1, 1, static_cast<uint32_t>(data.size()), static_cast<uint32_t>(data.size() + 7))
      .append(data);
  for (int k = 0; k < 7; ++k) foreign.u8(0xEE);
  Bytes longName;
  longName
      .header("Aud__SimpleMixState", 1, 1, static_cast<uint32_t>(data.size()),
              static_cast<uint32_t>(data.size()))
      .append(data);
  Bytes headerOnly;
  headerOnly.header("AS", 1, 1, 101, 101);
  Bytes cutHeader;
  cutHeader.record("AS").u8(1);
  Bytes emptyOwn;
  emptyOwn.header("AS", 1, 1, 0, 0);
  Bytes padded;  // two bytes of the layer left unread
  padded.header("AS", 1, 1, static_cast<uint32_t>(data.size() + 2), static_cast<uint32_t>(data.size() + 2))
      .append(data)
      .u16(0);
  Bytes overread;  // own size short of what the counts need: refused before reading
  overread.header("AS", 1, 1, static_cast<uint32_t>(data.size() - 2), static_cast<uint32_t>(data.size() - 2))
      .append(data);
  Bytes beyond;  // sizes past the end of the data end at the end of the data
  beyond.header("AS", 1, 1, 0xFFFFFF00u, 0xFFFFFFF0u).append(data);

  struct Case {
    const char* what;
    Bytes chunk;
    Status status;
    bool valid;
    std::string message;
    std::string printed;
    int endOffset;  // expected position relative to the end of the data
  };
  const Case cases[] = {
      {"foreign chunk", foreign, StreamableTraitsBase::eWrongLayer, false,
       "Expected short name 'AS' for layer Aud__SimpleMixState, got XY.", "", 0},
      {"long layer name", longName, StreamableTraitsBase::eUnpacked, true, "", "", 0},
      {"header then end", headerOnly, StreamableTraitsBase::eUnexpectedEnd, false,
       "Unexpected end-of-file while unpacking Taggable.Aud__SimpleMixState, layer Aud__SimpleMixState.", "",
       0},
      {"header cut short", cutHeader, StreamableTraitsBase::eUnexpectedEnd, false,
       "Unexpected end-of-file while unpacking Taggable.Aud__SimpleMixState, layer Aud__SimpleMixState.", "",
       0},
      {"no own data", emptyOwn, StreamableTraitsBase::eUnpacked, false, "", "", 0},
      {"data left unread", padded, StreamableTraitsBase::eUnpacked, true, "",
       "Warning: Not all object data was read while unpacking object Taggable.Aud__SimpleMixState, layer "
       "Aud__SimpleMixState v1.1, 2/103 bytes unread.\n",
       0},
      {"own size short of the tables", overread, StreamableTraitsBase::eFailed, false,
       "Encountered invalid table sizes while unpacking SoftwareAudioMixer::SimpleMixState", "", -2},
      {"sizes beyond the data", beyond, StreamableTraitsBase::eUnpacked, true, "", "", 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    testing::internal::CaptureStdout();
    Unpacked u = unpack(mixtest::baseChunks(c.chunk.size()).append(c.chunk));
    EXPECT_EQ(testing::internal::GetCapturedStdout(), c.printed);
    EXPECT_EQ(u.status, c.status);
    EXPECT_EQ(u.state->valid(), c.valid);
    EXPECT_EQ(u.message, c.message);
    EXPECT_EQ(static_cast<int>(u.position) - static_cast<int>(u.size), c.endOffset);
    // The builder gives up on 6 only.
    PStream again(mixtest::baseChunks(c.chunk.size()).append(c.chunk).data.data(),
                  mixtest::baseChunks(c.chunk.size()).append(c.chunk).size());
    testing::internal::CaptureStdout();
    std::unique_ptr<Streamable> built(SimpleMixState::STRM_L_SimpleMixState_builder(again));
    testing::internal::GetCapturedStdout();
    EXPECT_EQ(built == nullptr, c.status == StreamableTraitsBase::eFailed);
  }
}

TEST(SimpleMixStateStream, VersionOneHeadersUseVariableLengthNumbers) {
  // A version-1 stream: revisions as one byte (or 255 and 16 bits), sizes as
  // 16 bits (or 65535 and 32 bits).
  auto v1Header = [](Bytes& b, const std::string& name, unsigned major, unsigned minor, uint32_t own,
                     uint32_t total) {
    b.record(name);
    for (unsigned rev : {major, minor}) {
      if (rev < 255)
        b.u8(rev);
      else
        b.u8(255).u16(rev);
    }
    for (uint32_t size : {own, total}) {
      if (size < 65535)
        b.u16(size);
      else
        b.u16(65535).u32(size);
    }
  };
  // Large enough that the sizes need the escape.
  const int ni = 300, nm = 128, no = 150;
  const Bytes data = layerData(ni, nm, no, 0.5f, 1.0f);
  ASSERT_GT(data.size(), 65535u);
  Bytes as;
  v1Header(as, "AS", 1, 0, static_cast<uint32_t>(data.size()), static_cast<uint32_t>(data.size()));
  as.append(data);
  Bytes tg;
  v1Header(tg, "TG", 1, 0, 12, static_cast<uint32_t>(12 + as.size()));
  tg.u32(1).u32(2).u32(3).append(as);
  Bytes all;
  v1Header(all, "$", 1, 0, 0, static_cast<uint32_t>(tg.size()));
  all.append(tg);

  Unpacked u = unpack(all, 1);
  ASSERT_EQ(u.status, StreamableTraitsBase::eUnpacked) << u.message;
  EXPECT_EQ(u.position, u.size);
  EXPECT_EQ(u.state->tag(), IdStamp(1, 2, 3));
  EXPECT_EQ(u.state->revisionMinor(), 0);
  EXPECT_FLOAT_EQ(u.state->getInputLevel(ni - 1), 0.8021483f);
  EXPECT_TRUE(u.state->getMixRoutedToOutput(-1, 1, false));

  // A root header naming version 1 switches a stream read as version 2, its
  // own sizes included.
  Bytes switched;
  switched.record("$").u8(1).u8(0).u16(0).u16(65535).u32(static_cast<uint32_t>(tg.size())).append(tg);
  u = unpack(switched, 2);
  EXPECT_EQ(u.status, StreamableTraitsBase::eUnpacked) << u.message;
  EXPECT_EQ(u.position, u.size);

  // Revisions above 255 and unknown format versions are refused.
  struct Case {
    unsigned major, minor;
    int version;
    std::string message;
  };
  const Case cases[] = {
      {300, 0, 1, " Strm1.0 Object has oversized major rev (AS). "},
      {1, 256, 1, " Strm1.0 Object has oversized minor rev (AS). "},
      {1, 1, 3, "Unrecognized version for Streamable base"},
      {1, 1, 0, "Unrecognized version for Streamable base"},
  };
  for (const Case& c : cases) {
    Bytes b;
    v1Header(b, "AS", c.major, c.minor, 0, 0);
    Unpacked bad = unpack(b, c.version);
    EXPECT_EQ(bad.status, StreamableTraitsBase::eFailed) << c.message;
    EXPECT_EQ(bad.message, c.message);
    EXPECT_FALSE(bad.state->valid());
  }
}

TEST(SimpleMixStateStream, ABaseLayerReadPastItsOwnSizeFails) {
  // The Taggable chunk claims 8 bytes of data but its reader takes 12.
  const Bytes data = layerData(1, 1, 2, 1.0f, 1.0f);
  Bytes as;
  as.header("AS", 1, 1, static_cast<uint32_t>(data.size()), static_cast<uint32_t>(data.size())).append(data);
  Bytes all;
  all.header("$", 2, 0, 0, static_cast<uint32_t>(24 + as.size()));
  all.header("TG", 1, 0, 8, static_cast<uint32_t>(8 + as.size())).u32(1).u32(2).u32(3).append(as);
  Unpacked u = unpack(all);
  EXPECT_EQ(u.status, StreamableTraitsBase::eFailed);
  EXPECT_EQ(
      u.message,
      "Error: Unpacker read beyond end of chunk while unpacking object Taggable.Aud__SimpleMixState, layer "
      "Taggable v1.0, 4 bytes overread.\n");
  EXPECT_FALSE(u.state->valid());
  // Over-reading the end of the data itself is seen too.
  Bytes cut;
  cut.header("$", 2, 0, 0, 30).header("TG", 1, 0, 12, 12).u32(1).u32(2);
  u = unpack(cut);
  EXPECT_EQ(u.status, StreamableTraitsBase::eFailed);
  EXPECT_NE(u.message.find("4 bytes overread"), std::string::npos) << u.message;
}

TEST(SimpleMixStateStream, NamesAndRegistration) {
  EXPECT_EQ(std::string(SimpleMixState::layerName().c_str()), "Aud__SimpleMixState");
  EXPECT_STREQ(SimpleMixState::shortLayerName(), "AS");
  struct Row {
    bool withRoot, shortNames;
    const char* name;
  };
  const Row rows[] = {{false, false, "Taggable.Aud__SimpleMixState"},
                      {false, true, "TG.AS"},
                      {true, false, "Streamable.Taggable.Aud__SimpleMixState"},
                      {true, true, "$.TG.AS"}};
  SimpleMixState s(1, 0, 2);
  for (const Row& r : rows) {
    EXPECT_STREQ(SimpleMixState::subHierarchyName(r.withRoot, r.shortNames).c_str(), r.name);
    EXPECT_STREQ(s.hierarchyName(r.withRoot, r.shortNames).c_str(), r.name);
  }
  EXPECT_EQ(StreamClassRegistry::find("TG.AS"), &SimpleMixState::STRM_L_SimpleMixState_builder);
  EXPECT_EQ(StreamClassRegistry::find("Taggable.Aud__SimpleMixState"),
            &SimpleMixState::STRM_L_SimpleMixState_builder);

  // Any registered object goes out and comes back through the registry.
  std::mt19937 rng(9);
  SimpleMixState original(4, 2, 3);
  mixtest::randomize(original, 4, 2, 3, rng);
  PStream stream;
  EXPECT_EQ(StreamClassRegistry::writeObject(stream, original), StreamableTraitsBase::ePacked);
  EXPECT_EQ(StreamClassRegistry::writeObject(stream, original), StreamableTraitsBase::ePacked);
  stream.position(0);
  for (int k = 0; k < 2; ++k) {
    std::unique_ptr<Streamable> back = StreamClassRegistry::readObject(stream);
    ASSERT_NE(back, nullptr) << stream.messageText().c_str();
    auto* state = dynamic_cast<SimpleMixState*>(back.get());
    ASSERT_NE(state, nullptr);
    mixtest::expectSameEntries(*state, original, 4, 2, 3);
  }
  EXPECT_TRUE(stream.eof());
}

}  // namespace
