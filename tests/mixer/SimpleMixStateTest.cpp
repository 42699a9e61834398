#include <gtest/gtest.h>

#include <atomic>
#include <bit>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <functional>
#include <limits>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "host/HostHooks.h"
#include "host/IniFile.h"
#include "host/StreamClassRegistry.h"
#include "tonebits/dsp/Aud__GainCurve.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

using Aud::SimpleMixState;
using S = SimpleMixState;
using T = StreamableTraitsBase;

// Builds expected streams independently of the stream classes.
struct Bytes {
  std::vector<uint8_t> data;
  Bytes& u8(unsigned v) { return data.push_back(static_cast<uint8_t>(v)), *this; }
  Bytes& u16(unsigned v) { return u8(v & 0xFF).u8((v >> 8) & 0xFF); }
  Bytes& u32(uint32_t v) { return u16(v & 0xFFFF).u16(v >> 16); }
  Bytes& f32(float v) { return u32(std::bit_cast<uint32_t>(v)); }
  Bytes& append(const std::vector<uint8_t>& b) { return data.insert(data.end(), b.begin(), b.end()), *this; }
  Bytes& append(const Bytes& b) { return append(b.data); }
  Bytes& record(const std::string& s) { return block(std::vector<uint8_t>(s.begin(), s.end())); }
  Bytes& block(const std::vector<uint8_t>& b) { return u32(static_cast<uint32_t>(b.size())).append(b); }
  Bytes& header(const std::string& name, unsigned major, unsigned minor, uint32_t own, uint32_t total) {
    return record(name).u8(major).u8(minor).u32(own).u32(total);
  }
  std::size_t size() const { return data.size(); }
};

// The root and Taggable chunks in front of a layer chunk of `nested` bytes.
Bytes baseChunks(std::size_t nested, const IdStamp& tag = IdStamp::invalidStamp()) {
  Bytes b;
  b.header("$", 2, 0, 0, static_cast<uint32_t>(28 + nested));
  b.header("TG", 1, 0, 12, static_cast<uint32_t>(12 + nested));
  for (int i = 0; i < 3; ++i) b.u32(tag.word(i));
  return b;
}

struct Dims {
  int ni, nm, no;
};
constexpr Dims kAll{1 << 20, 1 << 20, 1 << 20};

// Entry-by-entry equality of a (with user counts n), floats bit for bit:
// entries within `from` are compared with b, the others with `rest`; mutes
// and solos with `rest` too unless `muteSolo`.
void expectSame(S& a, S& b, Dims n, bool muteSolo = true, Dims from = kAll, S* rest = nullptr) {
  auto ref = [&](bool inB) -> S& { return inB || !rest ? b : *rest; };
  auto bits = [](float f) { return std::bit_cast<uint32_t>(f); };
  for (int i = 0; i < n.ni; ++i) {
    SCOPED_TRACE("input " + std::to_string(i));
    S &r = ref(i < from.ni), &flags = muteSolo ? r : *rest;
    EXPECT_EQ(bits(a.getInputLevel(i)), bits(r.getInputLevel(i)));
    EXPECT_EQ(bits(a.getInputPan(i)), bits(r.getInputPan(i)));
    EXPECT_EQ(a.getInputMuteState(i), flags.getInputMuteState(i));
    EXPECT_EQ(a.getInputSoloState(i), flags.getInputSoloState(i));
    for (int m = -1; m < n.nm; ++m)
      EXPECT_EQ(a.getInputRoutedToMix(i, m), ref(i < from.ni && m < from.nm).getInputRoutedToMix(i, m)) << m;
  }
  for (int m = -1; m < n.nm; ++m) {
    SCOPED_TRACE("mix " + std::to_string(m));
    S &r = ref(m < from.nm), &flags = muteSolo ? r : *rest;
    EXPECT_EQ(bits(a.getMixLevel(m)), bits(r.getMixLevel(m)));
    EXPECT_EQ(a.getMixMuteState(m), flags.getMixMuteState(m));
    EXPECT_EQ(a.getMixSoloState(m), flags.getMixSoloState(m));
    for (int o = -2; o < n.no; ++o)
      for (bool l : {true, false})
        EXPECT_EQ(a.getMixRoutedToOutput(m, o, l),
                  ref(m < from.nm && o < from.no).getMixRoutedToOutput(m, o, l))
            << o << (l ? "L" : "R");
  }
}

// Random settings through the setters; ten decimals give the levels back.
void randomize(S& s, Dims n, std::mt19937& rng) {
  std::uniform_real_distribution<float> level(0.01f, 1.5f), pan(0.0f, 1.0f);
  std::bernoulli_distribution coin(0.5);
  for (int i = 0; i < n.ni; ++i) {
    s.setInputLevel(i, level(rng));
    s.setInputPan(i, pan(rng) + 0.01f);
    s.setInputMuteState(i, coin(rng));
    s.setInputSoloState(i, coin(rng));
    for (int m = -1; m < n.nm; ++m) s.setInputRoutedToMix(i, m, coin(rng));
  }
  for (int m = -1; m < n.nm; ++m) {
    s.setMixLevel(m, level(rng));
    s.setMixMuteState(m, coin(rng));
    s.setMixSoloState(m, coin(rng));
    for (int o = -2; o < n.no; ++o)
      for (bool left : {true, false}) s.setMixRoutedToOutput(m, o, left, coin(rng));
  }
}

std::vector<std::string> lines(const KvIniFile& file, const char* section) {
  std::vector<std::string> out;
  for (const Kv::AttribValuePair& p : file[String(section)]) out.emplace_back(p.line().c_str());
  return out;
}

void retrieve(S& s, const std::string& text) {
  KvIniFile f;
  f.parse(text.c_str());
  s.retrieveCompatibleConfigurationInformation(f);
}

TEST(SimpleMixState, LevelSettersClampPanSetterDoesNot) {
  const float inf = std::numeric_limits<float>::infinity();
  const std::pair<float, float> rows[] = {{2.0f, 1.5f}, {-1.0f, 0.0f}, {1.5f, 1.5f}, {0.0f, 0.0f},
                                          {0.3f, 0.3f}, {inf, 1.5f},   {-inf, 0.0f}, {1.5000001f, 1.5f}};
  S s(1, 1, 2);
  for (const auto& [in, level] : rows) {
    s.setInputLevel(0, in);
    s.setMixLevel(0, in);
    s.setInputPan(0, in);
    EXPECT_TRUE(s.getInputLevel(0) == level && s.getMixLevel(0) == level && s.getInputPan(0) == in) << in;
  }
  s.setInputLevel(0, std::numeric_limits<float>::quiet_NaN());
  EXPECT_TRUE(std::isnan(s.getInputLevel(0)));
}

// Each setter marks dirty and changes exactly its own stored line; out of
// range, nothing changes and getters read neutral values, not memory beside.
TEST(SimpleMixState, SettersChangeTheirOwnEntryOnlyGettersReadNeutralOutOfRange) {
  auto stored = [](S& s) {
    KvIniFile f;
    s.storeCompatibleConfigurationInformation(f);
    std::vector<std::string> out;
    for (const String& name : f.sectionNames())
      for (const auto& p : f[name]) out.push_back(std::string(name.c_str()) + " " + p.line().c_str());
    return out;
  };
  const std::pair<std::function<void(S&)>, std::string> cases[] = {
      {[](S& s) { s.setInputLevel(2, 0.25f); }, "InputChannels.Fader 002=0.2500000000"},
      {[](S& s) { s.setInputPan(1, 0.0f); }, "InputChannels.Pan 001=0.0000000000"},
      {[](S& s) { s.setInputMuteState(0, true); }, "InputChannels.Mute 000=1"},
      {[](S& s) { s.setInputSoloState(2, true); }, "InputChannels.Solo 002=1"},
      {[](S& s) { s.setInputRoutedToMix(1, 1, true); }, "InputChannels.RouteToMix 001->02=1"},
      {[](S& s) { s.setMixLevel(-1, 0.5f); }, "MixChannels.Fader 00=0.5000000000"},
      {[](S& s) { s.setMixMuteState(1, true); }, "MixChannels.Mute 02=1"},
      {[](S& s) { s.setMixSoloState(0, true); }, "MixChannels.Solo 01=1"},
      {[](S& s) { s.setMixRoutedToOutput(-1, 0, true, false); }, "MixChannels.RouteToOutput 00L->02=0"},
      {[](S& s) { s.setInputLevel(-1, 0.5f), s.setInputLevel(3, 0.5f), s.setInputPan(3, 0.1f); }, ""},
      {[](S& s) { s.setInputMuteState(-7, true), s.setInputSoloState(3, true); }, ""},
      {[](S& s) {
         s.setInputRoutedToMix(0, 2, 1), s.setInputRoutedToMix(0, -2, 1), s.setInputRoutedToMix(3, 0, 1);
       },
       ""},
      {[](S& s) {
         s.setMixLevel(-2, 0.5f), s.setMixLevel(2, 0.5f), s.setMixMuteState(2, 1), s.setMixSoloState(-2, 1);
       },
       ""},
      // The main mix feeds no pseudo output.
      {[](S& s) { s.setMixRoutedToOutput(0, 3, 1, 0), s.setMixRoutedToOutput(-1, -2, 1, 1); }, ""},
      {[](S& s) { s.setMixRoutedToOutput(0, -3, true, true); }, ""},
  };
  S fresh(3, 2, 3);
  EXPECT_TRUE(fresh.valid() && !fresh.getDirty());
  const std::vector<std::string> before = stored(fresh);
  for (std::size_t k = 0; k < std::size(cases); ++k) {
    SCOPED_TRACE(k);
    S s(3, 2, 3);
    cases[k].first(s);
    const std::string& line = cases[k].second;
    EXPECT_EQ(s.getDirty(), !line.empty());
    std::vector<std::string> changed, want;
    for (const std::string& l : stored(s))
      if (std::find(before.begin(), before.end(), l) == before.end()) changed.push_back(l);
    if (!line.empty()) want.push_back("SimpleMixState." + line);
    EXPECT_EQ(changed, want);
  }
  for (int bad : {-1000000, -3, 3, 4, 1 << 30}) {
    EXPECT_EQ(fresh.getInputLevel(bad) + fresh.getInputPan(bad) + fresh.getMixLevel(bad), 0.0f) << bad;
    EXPECT_FALSE(fresh.getInputMuteState(bad) || fresh.getInputSoloState(bad) ||
                 fresh.getInputRoutedToMix(bad, -1) || fresh.getInputRoutedToMix(0, bad) ||
                 fresh.getMixMuteState(bad) || fresh.getMixSoloState(bad) ||
                 fresh.getMixRoutedToOutput(bad, 0, true) || fresh.getMixRoutedToOutput(0, bad, false))
        << bad;
  }
}

TEST(SimpleMixState, PhysicalOutputHasOneFeed) {
  S s(2, 2, 3);
  // Switching on a missing entry marks dirty but takes no feed.
  for (auto [m, o] : {std::pair{5, 0}, {-2, 1}, {0, 3}, {0, 40}}) s.setMixRoutedToOutput(m, o, true, true);
  EXPECT_TRUE(s.getDirty() && s.getMixRoutedToOutput(-1, 0, true) && s.getMixRoutedToOutput(-1, 1, false));
  // Mix 0's right side takes output 0 from the main mix's left side, then its own left from its right.
  s.setMixRoutedToOutput(0, 0, false, true);
  EXPECT_TRUE(s.getMixRoutedToOutput(0, 0, false) && !s.getMixRoutedToOutput(-1, 0, true) &&
              s.getMixRoutedToOutput(-1, 1, false));
  s.setMixRoutedToOutput(0, 0, true, true);
  EXPECT_TRUE(s.getMixRoutedToOutput(0, 0, true) && !s.getMixRoutedToOutput(0, 0, false));
  std::mt19937 rng(7);
  for (int k = 0; k < 500; ++k) {
    s.setMixRoutedToOutput(static_cast<int>(rng() % 3) - 1, static_cast<int>(rng() % 5) - 2, rng() & 1,
                           (rng() % 3) != 0);
    for (int out = 0; out < 3; ++out) {
      int feeds = 0;
      for (int mix = -1; mix < 2; ++mix)
        feeds += s.getMixRoutedToOutput(mix, out, true) + s.getMixRoutedToOutput(mix, out, false);
      ASSERT_LE(feeds, 1) << "output " << out << " after step " << k;
    }
  }
}

// Negative counts count as none, and the default routes go only where they
// fit, after a reset too; a reset marks dirty only when asked.
TEST(SimpleMixState, DefaultsAndReset) {
  std::mt19937 rng(3);
  // The counts asked for, and whether the main mix feeds outputs 0 and 1.
  const std::tuple<Dims, bool, bool> rows[] = {{{-5, -1, -3}, false, false}, {{1, 0, 0}, false, false},
                                               {{1, 0, 1}, true, false},     {{1, 0, 2}, true, true},
                                               {{0, 3, 2}, true, true},      {{4, 2, 4}, true, true}};
  for (auto [c, left, right] : rows) {
    S s(c.ni, c.nm, c.no), fresh(c.ni, c.nm, c.no);
    const Dims n{std::max(c.ni, 0), std::max(c.nm, 0), std::max(c.no, 0)};
    randomize(s, n, rng);
    s.clearDirty();
    s.resetToDefaultConfiguration(false);
    EXPECT_FALSE(s.getDirty());
    expectSame(s, fresh, n);
    EXPECT_TRUE(s.getMixRoutedToOutput(-1, 0, true) == left && s.getMixRoutedToOutput(-1, 1, false) == right);
    EXPECT_TRUE(s.getInputLevel(0) == (c.ni > 0 ? 1.0f : 0.0f) && s.getMixLevel(-1) == 1.0f);
    s.resetToDefaultConfiguration(true);
    EXPECT_TRUE(s.getDirty());
  }
}

// Channels move whole (level and mute), the count stays, routing does not
// move. The layout names the old channels, "n" a default one.
TEST(SimpleMixState, InsertAndRemoveInputsKeepTheCount) {
  const float level[] = {0.1f, 0.2f, 0.3f};
  // Insert `count` at `at`, or remove `at`; the layout after it.
  const std::tuple<char, unsigned long long, unsigned long long, const char*> cases[] = {
      {'i', 1, 0, "n01"}, {'i', 1, 2, "01n"},    {'i', 2, 1, "0nn"}, {'i', ~0ull, 1, "0nn"},
      {'i', 1, 3, "012"}, {'i', 0, 0, "012"},    {'r', 0, 0, "12n"}, {'r', 0, 2, "01n"},
      {'r', 0, 3, "012"}, {'r', 0, ~0ull, "012"}};
  for (auto [op, count, at, layout] : cases) {
    SCOPED_TRACE(testing::Message() << op << count << "@" << at);
    S s(3, 0, 2);
    for (int i = 0; i < 3; ++i) s.setInputLevel(i, level[i]);
    s.setInputMuteState(1, true);
    s.setInputRoutedToMix(2, -1, false);
    s.clearDirty();
    op == 'i' ? s.insertInputs(count, at) : s.removeInput(at);
    for (int i = 0; i < 3; ++i) {
      const int from = layout[i] == 'n' ? -1 : layout[i] - '0';
      EXPECT_TRUE(s.getInputLevel(i) == (from < 0 ? 1.0f : level[from]) &&
                  s.getInputMuteState(i) == (from == 1))
          << i;
    }
    EXPECT_FALSE(s.getDirty() || s.getInputRoutedToMix(2, -1));
  }
}

TEST(SimpleMixState, TwoThreadsCopyingIntoEachOtherDoNotDeadlock) {
  S a(8, 2, 4), b(8, 2, 4);
  for (S* x : {&a, &b}) x->setInputLevel(0, 0.25f);
  std::atomic<int> ready = 0;  // both start together
  auto copies = [&ready](S& to, S& from) {
    for (++ready; ready < 2;) std::this_thread::yield();
    for (int k = 0; k < 200000; ++k) to.copyFrom(from, false);
  };
  std::thread t1(copies, std::ref(a), std::ref(b)), t2(copies, std::ref(b), std::ref(a));
  for (std::thread* t : {&t1, &t2}) t->join();
  EXPECT_TRUE(a.getInputLevel(0) == 0.25f && b.getInputLevel(0) == 0.25f);
}

TEST(SimpleMixState, CopiesAndClones) {
  std::mt19937 rng(5);
  S s(3, 2, 2), target(3, 2, 2), empty, invalid;
  randomize(s, {3, 2, 2}, rng);
  S copy(s);  // the tag and dirty flag too, in tables of its own
  EXPECT_TRUE(copy.tag() == s.tag() && copy.getDirty());
  expectSame(copy, s, {3, 2, 2});
  copy.setInputLevel(0, 0.0f);
  EXPECT_NE(s.getInputLevel(0), 0.0f);
  target.copyFrom(s, true);  // takes over the dirty flag, not the tag
  EXPECT_TRUE(target.getDirty() && !s.getDirty() && target.tag() != s.tag());
  target.copyFrom(s, false);
  EXPECT_FALSE(target.getDirty());
  empty = s;
  expectSame(empty, s, {3, 2, 2});
  target.copyFrom(invalid, true);  // an invalid source has nothing to give
  target.copyFrom(target, true);   // nor does the state itself
  expectSame(target, s, {3, 2, 2});
  // copyFrom grows the target and fills what the source lacks with defaults.
  const std::pair<Dims, Dims> pairs[] = {
      {{2, 1, 2}, {4, 1, 2}}, {{4, 3, 5}, {2, 1, 2}}, {{3, 0, 1}, {1, 4, 0}}, {{2, 2, 2}, {2, 2, 2}}};
  for (const auto& [src, dst] : pairs) {
    S source(src.ni, src.nm, src.no), into(dst.ni, dst.nm, dst.no);
    randomize(source, src, rng);
    randomize(into, dst, rng);
    into.copyFrom(source, false);
    const Dims n{std::max(src.ni, dst.ni), std::max(src.nm, dst.nm), std::max(src.no, dst.no)};
    S defaults(n.ni, n.nm, n.no);
    expectSame(into, source, n, true, src, &defaults);
  }
  std::unique_ptr<Taggable> clone(s.clone());
  auto* c = dynamic_cast<S*>(clone.get());
  ASSERT_TRUE(c && c != &s && c->valid() && c->tag() != s.tag());
  expectSame(*c, s, {3, 2, 2});
  std::unique_ptr<Streamable> shell(s.clone(Streamable::eBuildForUnpack));  // empty, with the tag
  auto* e = dynamic_cast<S*>(shell.get());
  ASSERT_TRUE(e && !e->valid() && e->tag() == s.tag());
}

TEST(SimpleMixState, CallsOnAnInvalidStateAreReportedAndHarmless) {
  std::vector<std::string> reports;
  host::setFatalReportHandler([&](const char* m) { reports.emplace_back(m); });
  S s;
  EXPECT_FALSE(s.getInputLevel(0) || s.getMixRoutedToOutput(-1, 0, true));
  s.setInputLevel(0, 1.0f);
  s.setMixRoutedToOutput(-1, 0, true, true);
  s.resetToDefaultConfiguration(true);
  s.insertInputs(3, 0);
  s.removeInput(0);
  KvIniFile f;
  EXPECT_EQ(s.storeCompatibleConfigurationInformation(f), Aud::sSuccess);
  EXPECT_EQ(s.retrieveCompatibleConfigurationInformation(f), Aud::sSuccess);
  EXPECT_TRUE(f.sectionNames().empty() && !s.getDirty());
  host::setFatalReportHandler({});
  EXPECT_EQ(reports, std::vector<std::string>(7, "Function called on invalid MixerState!"));
}

std::vector<uint8_t> packed(const S& s) {
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
Bytes framed(const Bytes& layerChunk) { return baseChunks(layerChunk.size()).append(layerChunk); }

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
  std::unique_ptr<S> state;
  std::string message;
  int endOffset;  // position relative to the end of the data
};

Unpacked unpack(const Bytes& bytes, int formatVersion = 2) {
  PStream s(bytes.data.data(), bytes.size());
  s.formatVersion(formatVersion);
  Unpacked u;
  u.state.reset(static_cast<S*>(S(0, 0, 0).clone(Streamable::eBuildForUnpack)));
  u.status = u.state->STRM_hierarchyUnpack(s);
  u.message = s.messageText().c_str();
  u.endOffset = static_cast<int>(s.position()) - static_cast<int>(s.size());
  return u;
}

TEST(SimpleMixStateStream, PacksTheExactLayerBytes) {
  S s(2, 1, 2);
  const Bytes layer = Bytes().header("AS", 1, 1, 101, 101).append(layerData(2, 2, 4, 1.0f, 1.0f));
  EXPECT_EQ(packed(s), baseChunks(layer.size(), s.tag()).append(layer).data);
  EXPECT_EQ(s.revisionMajor() * 10 + s.revisionMinor(), 11);
  const S invalid;  // packs to one zero
  const Bytes zero = chunk(Bytes().u8(0));
  EXPECT_EQ(packed(invalid), baseChunks(zero.size(), invalid.tag()).append(zero).data);
  for (const char* name : {"TG.AS", "Taggable.Aud__SimpleMixState"})
    EXPECT_EQ(StreamClassRegistry::find(name), &S::STRM_L_SimpleMixState_builder);
}

// Through a configuration file beside a section of someone else's (mutes
// and solos are not read back), then through an object stream bit for bit.
TEST(SimpleMixStatePersistence, RandomStatesRoundTrip) {
  std::mt19937 rng(2024);
  const std::string path = testing::TempDir() + "mixstate_ini_test.ini";
  const Dims sizes[] = {{0, 0, 0}, {1, 0, 0},  {0, 3, 1},    {2, 1, 2},
                        {5, 3, 7}, {13, 2, 1}, {64, 16, 32}, {3, 0, 1}};
  for (const Dims& n : sizes) {
    SCOPED_TRACE(testing::Message() << n.ni << "x" << n.nm << "x" << n.no);
    S s(n.ni, n.nm, n.no), back(n.ni, n.nm, n.no), defaults(n.ni, n.nm, n.no);
    randomize(s, n, rng);
    KvIniFile f, loaded;
    EXPECT_EQ(s.storeCompatibleConfigurationInformation(f), Aud::sSuccess);
    f[String("Other")].emplace_back(String("keep=me"));
    ASSERT_TRUE(f.save(path.c_str()) && loaded.load(path.c_str()));
    ASSERT_EQ(back.retrieveCompatibleConfigurationInformation(loaded), Aud::sSuccess);
    EXPECT_TRUE(back.getDirty());
    expectSame(back, s, n, false, kAll, &defaults);
    EXPECT_EQ(lines(loaded, "Other"), std::vector<std::string>{"keep=me"});

    s.setInputPan(0, std::numeric_limits<float>::quiet_NaN());
    s.setInputPan(n.ni - 1, -0.0f);
    PStream stream;
    ASSERT_EQ(s.STRM_hierarchyPack(stream), T::ePacked);
    stream.position(0);
    std::unique_ptr<Streamable> built(S::STRM_L_SimpleMixState_builder(stream));
    ASSERT_NE(built, nullptr) << stream.messageText().c_str();
    EXPECT_TRUE(stream.messageText().isEmpty() && stream.position() == stream.size());
    auto& r = static_cast<S&>(*built);
    EXPECT_TRUE(!r.getDirty() && r.revisionMajor() == 1 && r.revisionMinor() == 1 && r.tag() == s.tag());
    expectSame(r, s, n);
    EXPECT_EQ(packed(r), packed(s));
  }
  std::remove(path.c_str());
}

TEST(SimpleMixStateStream, RevisionOneZeroLevelsAreMagnitudes) {
  // Revision minor, stored level, level read.
  const std::tuple<unsigned, float, float> rows[] = {
      {0, 0.5f, 0.8021483f}, {0, 1.0f, 1.0f}, {0, 2.0f, 1.245188f}, {0, 0.0f, 0.0f}, {1, 2.0f, 2.0f}};
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
  const Bytes data = layerData(2, 2, 4, 1.0f, 1.0f), as = chunk(data);
  const auto n = static_cast<uint32_t>(data.size());
  const std::vector<uint8_t> tables(data.data.begin() + 13, data.data.end());
  Bytes shortBlock = data;
  shortBlock.data[13 + 36] = 3;  // input-to-mix block of 3 bytes instead of 4
  const Bytes foreign =
      Bytes().header("XY", 1, 1, n, n + 7).append(data).append(std::vector<uint8_t>(7, 0xEE));
  // The Taggable chunk claims 8 bytes of data but its reader takes 12.
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
      {"format 3", v1Header("AS", 1, 1, 0, 0), T::eFailed, false, "Unrecognized version for Streamable base",
       3, std::nullopt},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    testing::internal::CaptureStdout();
    Unpacked u = unpack(c.stream, c.formatVersion);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), c.printed);
    EXPECT_TRUE(u.status == c.status && u.state->valid() == c.valid) << u.status;
    EXPECT_EQ(u.message, c.message);
    EXPECT_EQ(u.endOffset, c.endOffset.value_or(u.endOffset));
    // The builder gives up on failures only.
    PStream again(c.stream.data.data(), c.stream.size());
    again.formatVersion(c.formatVersion);
    testing::internal::CaptureStdout();
    std::unique_ptr<Streamable> built(S::STRM_L_SimpleMixState_builder(again));
    testing::internal::GetCapturedStdout();
    EXPECT_EQ(built == nullptr, c.status == T::eFailed);
  }
}

TEST(SimpleMixStateStream, VersionOneHeadersUseVariableLengthNumbers) {
  const int ni = 300, nm = 128, no = 150;  // large enough that the sizes need the escape
  const Bytes data = layerData(ni, nm, no, 0.5f, 1.0f);
  ASSERT_GT(data.size(), 65535u);
  const Bytes as = v1Header("AS", 1, 0, data.size(), data.size()).append(data);
  const Bytes tg =
      v1Header("TG", 1, 0, 12, static_cast<uint32_t>(12 + as.size())).u32(1).u32(2).u32(3).append(as);
  Unpacked u = unpack(v1Header("$", 1, 0, 0, static_cast<uint32_t>(tg.size())).append(tg), 1);
  ASSERT_EQ(u.status, T::eUnpacked) << u.message;
  EXPECT_TRUE(u.endOffset == 0 && u.state->tag() == IdStamp(1, 2, 3) &&
              u.state->getMixRoutedToOutput(-1, 1, false));
  EXPECT_FLOAT_EQ(u.state->getInputLevel(ni - 1), 0.8021483f);
  // A root header naming version 1 switches a stream read as version 2, its own sizes included.
  u = unpack(
      Bytes().record("$").u8(1).u8(0).u16(0).u16(65535).u32(static_cast<uint32_t>(tg.size())).append(tg));
  EXPECT_EQ(u.status, T::eUnpacked) << u.message;
  EXPECT_EQ(u.endOffset, 0);
}

TEST(SimpleMixStateIni, StoresTheExactLinesInLoopOrder) {
  S s(2, 1, 2);
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

// The version decides whether levels are magnitudes (compared to about four
// units in the last place, the rest exactly; a later version line wins);
// values are clamped and scanned as the C library's runtime scans them.
TEST(SimpleMixStateIni, FaderValuesByVersion) {
  const std::tuple<std::string, const char*, float> rows[] = {
      {"Version=1.0", "000=0.5", 0.8021483f},
      {"version=1.0", "000=0.5", 0.8021483f},
      {"VERSION= 1.0", "000=0.5", 0.8021483f},
      {"Version=1.1\nVersion=1.0", "000=0.5", 0.8021483f},
      {"Version=1.0", "000=2.0", 1.245188f},
      {"Version=1.0", "000=9.0", 1.5f},
      {"Version=1.1", "000=0.5", 0.5f},
      {"Version=1", "000=0.5", 0.5f},
      {"Version=2.0", "000=0.5", 0.5f},
      {"", "000=0.5", 0.5f},
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
    S s(1, 1, 2);
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
  S defaults(4, 1, 2);
  for (const auto& [section, bad] : rows)
    for (const char* line : bad) {
      SCOPED_TRACE(line);
      S s(4, 1, 2);
      retrieve(s, std::string("[SimpleMixState.") + section + "]\n" + line + "\n");
      expectSame(s, defaults, {4, 1, 2});
    }
}

TEST(SimpleMixStateIni, RoutesApplyInFileOrderUnderTheOneFeedRule) {
  S s(1, 2, 2);
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
    S writer(from.ni, from.nm, from.no), reader(to.ni, to.nm, to.no), defaults(to.ni, to.nm, to.no);
    randomize(writer, from, rng);
    KvIniFile f;
    writer.storeCompatibleConfigurationInformation(f);
    reader.retrieveCompatibleConfigurationInformation(f);
    expectSame(reader, writer, to, false, from, &defaults);
  }
}

}  // namespace
