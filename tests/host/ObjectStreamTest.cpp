#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "host/GrowString.h"
#include "host/ObjectStream.h"

namespace {

std::vector<unsigned char> bytesOf(const StreamFile& s) {
  const auto c = s.contents();
  return {c.begin(), c.end()};
}

using V = std::vector<unsigned char>;

TEST(ObjectStream, NumbersAreLittleEndianWhateverTheMachine) {
  struct Row {
    const char* what;
    void (*write)(PStream&);
    V bytes;
  };
  const Row rows[] = {
      {"char", [](PStream& s) { s.setCookedChar('\xA5'); }, {0xA5}},
      {"unsigned short", [](PStream& s) { s.setUnsignedShort(0xBEEF); }, {0xEF, 0xBE}},
      {"short", [](PStream& s) { s.setShort(-2); }, {0xFE, 0xFF}},
      {"long", [](PStream& s) { s.setLong(-2); }, {0xFE, 0xFF, 0xFF, 0xFF}},
      {"unsigned long", [](PStream& s) { s.setUnsignedLong(0x01020304u); }, {0x04, 0x03, 0x02, 0x01}},
      {"float 1.0", [](PStream& s) { s.setFloat(1.0f); }, {0x00, 0x00, 0x80, 0x3F}},
      {"float -0.0", [](PStream& s) { s.setFloat(-0.0f); }, {0x00, 0x00, 0x00, 0x80}},
      {"binary block",
       [](PStream& s) { s.writeBinary(reinterpret_cast<const unsigned char*>("\1\0\2"), 3, true, false); },
       {3, 0, 0, 0, 1, 0, 2}},
      {"text by terminator",
       [](PStream& s) { s.writeBinary(reinterpret_cast<const unsigned char*>("AS"), 0, false, false); },
       {2, 0, 0, 0, 'A', 'S'}},
      {"text by length",
       [](PStream& s) { s.writeBinary(reinterpret_cast<const unsigned char*>("ASX"), 2, false, false); },
       {2, 0, 0, 0, 'A', 'S'}},
      {"empty block", [](PStream& s) { s.writeBinary(nullptr, 5, true, false); }, {0, 0, 0, 0}},
      {"unframed",
       [](PStream& s) { s.writeBinary(reinterpret_cast<const unsigned char*>("xy"), 2, true, true); },
       {'x', 'y'}},
  };
  for (const Row& r : rows) {
    PStream s;
    r.write(s);
    EXPECT_EQ(bytesOf(s), r.bytes) << r.what;
    EXPECT_EQ(s.position(), r.bytes.size()) << r.what;
  }
}

TEST(ObjectStream, ReadsGiveBackWhatWasWritten) {
  PStream s;
  const float nan = std::numeric_limits<float>::quiet_NaN();
  s.setCookedChar(-3);
  s.setShort(-12345);
  s.setUnsignedShort(65535);
  s.setLong(-2000000000);
  s.setUnsignedLong(4000000000u);
  s.setFloat(nan);
  s.setFloat(-1.5e-40f);
  s.writeBinary(reinterpret_cast<const unsigned char*>("a\0b"), 3, true, false);
  s.writeBinary(reinterpret_cast<const unsigned char*>("name"), 0, false, false);
  s.position(0);
  EXPECT_EQ(s.getChar(), -3);
  EXPECT_EQ(s.getShort(), -12345);
  EXPECT_EQ(s.getUnsignedShort(), 65535);
  EXPECT_EQ(s.getLong(), -2000000000);
  EXPECT_EQ(s.getUnsignedLong(), 4000000000u);
  EXPECT_TRUE(std::isnan(s.getFloat()));
  EXPECT_EQ(s.getFloat(), -1.5e-40f);
  GrowString block, text;
  EXPECT_TRUE(s.readBinary(block, true));
  EXPECT_EQ(block.length(), 3u);
  EXPECT_EQ(std::memcmp(block.bytes(), "a\0b", 3), 0);
  EXPECT_FALSE(block == "a");  // the embedded zero is part of the content
  EXPECT_TRUE(s.readBinary(text, false));
  EXPECT_TRUE(text == "name");
  EXPECT_TRUE(s.eof());
  EXPECT_EQ(s.shortfall(), 0u);
}

TEST(ObjectStream, ReadsAtTheEndYieldZerosAndNeverPassIt) {
  const unsigned char data[] = {0x11, 0x22, 0x33};
  PStream s(data, sizeof data);
  s.position(1);
  EXPECT_EQ(s.getUnsignedLong(), 0x3322u);  // two bytes there, two zeros
  EXPECT_EQ(s.position(), 3u);
  EXPECT_EQ(s.shortfall(), 2u);
  EXPECT_EQ(s.getFloat(), 0.0f);
  EXPECT_EQ(s.getChar(), 0);
  EXPECT_EQ(s.position(), 3u);
  EXPECT_EQ(s.shortfall(), 7u);
  s.position(1000);  // beyond the data: at its end
  EXPECT_EQ(s.position(), 3u);
  EXPECT_TRUE(s.eof());

  // A record whose count points far beyond the data gives what is there.
  PStream r;
  r.setUnsignedLong(0xFFFFFFF0u);
  r.setCookedChar('z');
  r.position(0);
  GrowString out;
  EXPECT_FALSE(r.readBinary(out, true));
  EXPECT_TRUE(out == "z");
  EXPECT_TRUE(r.eof());
  // And a count cut short is no record at all.
  const unsigned char cut[] = {5, 0};
  PStream c(cut, sizeof cut);
  EXPECT_FALSE(c.readBinary(out, false));
  EXPECT_TRUE(out.isEmpty());
}

TEST(ObjectStream, WritesOverwriteInsideAndExtendAtTheEnd) {
  PStream s;
  s.setUnsignedLong(0xFFFFFFFFu);
  s.setUnsignedLong(0xFFFFFFFFu);
  s.position(2);
  s.setUnsignedShort(0);
  EXPECT_EQ(s.position(), 4u);
  s.position(6);
  s.setUnsignedLong(0x44332211u);
  EXPECT_EQ(bytesOf(s), (V{0xFF, 0xFF, 0, 0, 0xFF, 0xFF, 0x11, 0x22, 0x33, 0x44}));
  EXPECT_FALSE(s.writeFailed());
}

TEST(ObjectStream, DynamicIntegralStorageWidens) {
  struct Row {
    unsigned value;
    bool wide;  // <unsigned short, unsigned int> rather than <unsigned char, unsigned short>
    V bytes;
  };
  const Row rows[] = {
      {0, false, {0}},
      {254, false, {254}},
      {255, false, {255, 255, 0}},
      {256, false, {255, 0, 1}},
      {65535, false, {255, 255, 255}},
      {0, true, {0, 0}},
      {65534, true, {0xFE, 0xFF}},
      {65535, true, {0xFF, 0xFF, 0xFF, 0xFF, 0, 0}},
      {0x12345678, true, {0xFF, 0xFF, 0x78, 0x56, 0x34, 0x12}},
  };
  for (const Row& r : rows) {
    PStream s;
    if (r.wide) {
      s << DynamicIntegralStorage<unsigned short, unsigned int>(r.value);
    } else {
      s << DynamicIntegralStorage<unsigned char, unsigned short>(static_cast<unsigned short>(r.value));
    }
    EXPECT_EQ(bytesOf(s), r.bytes) << r.value;
    s.position(0);
    unsigned back;
    if (r.wide) {
      DynamicIntegralStorage<unsigned short, unsigned int> n;
      s >> n;
      back = n.value;
    } else {
      DynamicIntegralStorage<unsigned char, unsigned short> n;
      s >> n;
      back = n.value;
    }
    EXPECT_EQ(back, r.value);
    EXPECT_TRUE(s.eof());
  }
}

TEST(ObjectStream, FileBackedStreams) {
  const std::string path = testing::TempDir() + "object_stream_test.bin";
  {
    PStream s;
    ASSERT_TRUE(s.open(path.c_str(), StreamFile::eCreate));
    EXPECT_TRUE(s.isFile());
    s.setUnsignedLong(7);
    s.writeBinary(reinterpret_cast<const unsigned char*>("hello"), 0, false, false);
    s.position(0);
    EXPECT_EQ(s.getUnsignedLong(), 7u);  // read after write in one file
    s.position(s.size());
    s.setFloat(2.5f);  // write after read
    EXPECT_TRUE(s.close());
    EXPECT_FALSE(s.isFile());
  }
  {
    PStream s;
    ASSERT_TRUE(s.open(path.c_str(), StreamFile::eReadOnly));
    EXPECT_EQ(s.size(), 4u + 4u + 5u + 4u);
    EXPECT_EQ(s.getUnsignedLong(), 7u);
    GrowString t;
    EXPECT_TRUE(s.readBinary(t, false));
    EXPECT_TRUE(t == "hello");
    EXPECT_EQ(s.getFloat(), 2.5f);
    EXPECT_TRUE(s.eof());
    s.position(0);
    s.setUnsignedLong(9);  // read-only: dropped
    EXPECT_TRUE(s.writeFailed());
    EXPECT_EQ(s.position(), 0u);
    EXPECT_EQ(s.getUnsignedLong(), 7u);
    EXPECT_EQ(s.contents().size(), s.size());
  }
  {
    PStream s;
    ASSERT_TRUE(s.open(path.c_str(), StreamFile::eUpdate));
    s.position(s.size());
    s.setCookedChar('!');
    EXPECT_TRUE(s.flush());
    EXPECT_EQ(s.size(), 18u);
  }
  PStream missing;
  EXPECT_FALSE(missing.open((path + ".does-not-exist/x").c_str(), StreamFile::eReadOnly));
  EXPECT_FALSE(missing.isFile());
  std::remove(path.c_str());
}

TEST(GrowString, AppendsAnyBytesAndFormats) {
  GrowString g("ab");
  g.append('c').append(GrowString("de")).append("f", 1).append(String("gh"));
  g.appendf("%d-%s", 42, "x");
  EXPECT_TRUE(g == "abcdefgh42-x");
  EXPECT_FALSE(g == "abcdefgh42-");
  EXPECT_FALSE(g == nullptr);
  g.append("\0z", 2);
  EXPECT_EQ(g.length(), 14u);
  EXPECT_STREQ(g.c_str(), "abcdefgh42-x");
  g.clear();
  EXPECT_TRUE(g.isEmpty());
  EXPECT_TRUE(g == "");
}

}  // namespace
