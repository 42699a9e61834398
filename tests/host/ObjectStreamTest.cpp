#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <limits>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "host/GrowString.h"
#include "host/ObjectStream.h"

namespace {

using V = std::vector<unsigned char>;
V bytesOf(const StreamFile& s) {
  const auto c = s.contents();
  return {c.begin(), c.end()};
}
const unsigned char* u(const char* text) { return reinterpret_cast<const unsigned char*>(text); }

TEST(ObjectStream, NumbersAndRecordsAreLittleEndianReadBackAndOverwrite) {
  PStream s;
  s.setCookedChar('\xA5');
  s.setUnsignedShort(0xBEEF);
  s.setShort(-2);
  s.setLong(-2);
  s.setUnsignedLong(0x01020304u);
  s.setFloat(1.0f);
  s.setFloat(-0.0f);
  s.writeBinary(u("\1\0\2"), 3, true, false);  // a binary block
  s.writeBinary(u("AS"), 0, false, false);     // text by terminator
  s.writeBinary(u("ASX"), 2, false, false);    // text by length
  s.writeBinary(nullptr, 5, true, false);      // an empty block
  s.writeBinary(u("xy"), 2, true, true);       // unframed
  const V bytes{0xA5, 0xEF, 0xBE, 0xFE, 0xFF, 0xFE, 0xFF, 0xFF, 0xFF, 4, 3, 2, 1,   0,  0, 0x80,
                0x3F, 0,    0,    0,    0x80, 3,    0,    0,    0,    1, 0, 2, 2,   0,  0, 0,
                'A',  'S',  2,    0,    0,    0,    'A',  'S',  0,    0, 0, 0, 'x', 'y'};
  EXPECT_EQ(bytesOf(s), bytes);
  s.setFloat(std::numeric_limits<float>::quiet_NaN());
  s.setFloat(-1.5e-40f);
  s.position(0);
  EXPECT_EQ(s.getChar(), -0x5B);
  EXPECT_EQ(s.getUnsignedShort(), 0xBEEF);
  EXPECT_EQ(s.getShort(), -2);
  EXPECT_EQ(s.getLong(), -2);
  EXPECT_EQ(s.getUnsignedLong(), 0x01020304u);
  EXPECT_EQ(s.getFloat(), 1.0f);
  EXPECT_TRUE(std::signbit(s.getFloat()));
  GrowString block, text;
  EXPECT_TRUE(s.readBinary(block, true));
  EXPECT_EQ(block.view(), std::string_view("\1\0\2", 3));
  EXPECT_FALSE(block == "\1");  // the embedded zero is part of the content
  EXPECT_TRUE(s.readBinary(text, false));
  EXPECT_TRUE(text == "AS");
  s.position(bytes.size());
  EXPECT_TRUE(std::isnan(s.getFloat()));
  EXPECT_EQ(s.getFloat(), -1.5e-40f);
  EXPECT_TRUE(s.eof());
  EXPECT_EQ(s.shortfall(), 0u);

  PStream w;  // writes overwrite inside and extend at the end
  w.setUnsignedLong(0xFFFFFFFFu);
  w.setUnsignedLong(0xFFFFFFFFu);
  w.position(2);
  w.setUnsignedShort(0);
  w.position(6);
  w.setUnsignedLong(0x44332211u);
  EXPECT_EQ(bytesOf(w), (V{0xFF, 0xFF, 0, 0, 0xFF, 0xFF, 0x11, 0x22, 0x33, 0x44}));
  EXPECT_FALSE(w.writeFailed());
}

TEST(ObjectStream, ReadsAtTheEndYieldZerosAndNeverPassIt) {
  const unsigned char data[] = {0x11, 0x22, 0x33};
  PStream s(data, sizeof data);
  s.position(1);
  EXPECT_EQ(s.getUnsignedLong(), 0x3322u);  // two bytes there, two zeros
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

TEST(ObjectStream, DynamicIntegralStorageWidens) {
  using Narrow = DynamicIntegralStorage<unsigned char, unsigned short>;
  using Wide = DynamicIntegralStorage<unsigned short, unsigned int>;
  const unsigned short narrow[] = {0, 254, 255, 256, 65535};
  const unsigned wide[] = {0, 65534, 65535, 0x12345678};
  PStream s;
  for (auto v : narrow) s << Narrow(v);
  for (auto v : wide) s << Wide(v);
  EXPECT_EQ(bytesOf(s), (V{0,    254,  255,  255,  0,    255, 0, 1,    255,  255,  255,  0,    0,   0xFE,
                           0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0,   0, 0xFF, 0xFF, 0x78, 0x56, 0x34, 0x12}));
  s.position(0);
  auto back = [&](auto n) {
    s >> n;
    return n.value;
  };
  for (auto v : narrow) EXPECT_EQ(back(Narrow()), v);
  for (auto v : wide) EXPECT_EQ(back(Wide()), v);
  EXPECT_TRUE(s.eof());
}

TEST(ObjectStream, FileBackedStreams) {
  const std::string path = testing::TempDir() + "object_stream_test.bin";
  PStream s;
  ASSERT_TRUE(s.open(path.c_str(), StreamFile::eCreate));
  s.setUnsignedLong(7);
  s.writeBinary(u("hello"), 0, false, false);
  s.position(0);
  EXPECT_EQ(s.getUnsignedLong(), 7u);  // read after write in one file
  s.position(s.size());
  s.setFloat(2.5f);  // write after read
  EXPECT_TRUE(s.close());
  ASSERT_TRUE(s.open(path.c_str(), StreamFile::eReadOnly));
  EXPECT_EQ(bytesOf(s), (V{7, 0, 0, 0, 5, 0, 0, 0, 'h', 'e', 'l', 'l', 'o', 0, 0, 0x20, 0x40}));
  s.setUnsignedLong(9);  // read-only: dropped
  EXPECT_TRUE(s.writeFailed());
  EXPECT_EQ(s.getUnsignedLong(), 7u);

  ASSERT_TRUE(s.open(path.c_str(), StreamFile::eUpdate));
  s.position(s.size());
  s.setCookedChar('!');
  EXPECT_TRUE(s.flush());
  EXPECT_EQ(s.size(), 18u);
  EXPECT_FALSE(s.open((path + ".does-not-exist/x").c_str(), StreamFile::eReadOnly));
  EXPECT_FALSE(s.isFile());
  std::remove(path.c_str());
}

TEST(GrowString, AppendsAnyBytesAndFormats) {
  GrowString g("ab");
  g.append('c').append(GrowString("de")).append("f\0z", 3).append(String("gh")).appendf("%d-%s", 42, "x");
  EXPECT_EQ(g.view(), std::string_view("abcdef\0zgh42-x", 14));
  EXPECT_STREQ(g.c_str(), "abcdef");
  EXPECT_FALSE(g == "abcdef" || g == nullptr);
  g.clear();
  EXPECT_TRUE(g.isEmpty() && g == "");
}

}  // namespace
