#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <tuple>

#include "tonebits/foundation/Aud__Metadata.h"

namespace {

using Aud::Metadata;

Metadata describe(int dataType, int dataSigned, int bits, int stride) {
  Metadata m;
  m.setDataType(static_cast<Aud::eDataType>(dataType));
  m.setDataSigned(static_cast<Aud::eDataSigned>(dataSigned));
  m.setBitsPerSample(bits);
  m.setStride(stride);
  return m;
}

// Every field: coding, byte order, sign, streams, channels, rate, sample
// type, slot and bits.
auto fields(const Metadata& m) {
  return std::make_tuple(int(m.getDataType()), int(m.getEndianType()), int(m.getDataSigned()),
                         m.getAudioStreams(), m.getChannelsPerStream(), m.getSamplesPerSec(),
                         m.getSampleTypeNumber(), m.getStride(), m.getBitsPerSample());
}

TEST(Metadata, ConstructorSlotsPerSampleType) {
  // Integer PCM even for the floating-point types.
  const unsigned bits[] = {24, 16, 24, 8, 8, 24, 32, 32, 64}, strides[] = {4, 2, 3, 1, 1, 4, 4, 4, 8};
  for (int type = -1; type <= 9; ++type) {
    const bool known = type >= 0 && type < 9;
    const Metadata m(2, 3, 44100, type);
    EXPECT_EQ(fields(m), std::make_tuple(201, 0, type == 4 ? 2 : 1, 2u, 3u, 44100u, type,
                                         known ? strides[type] : 0u, known ? bits[type] : 0u));
    EXPECT_EQ(m.getTotalChannels(), 6u);
    EXPECT_EQ(m.getBytesPerSample(), known ? bits[type] / 8 : 0u) << type;
  }
  Metadata m(1, 2, 48000, 5);
  m.invalidate();
  EXPECT_EQ(0, std::memcmp(&m, &static_cast<const Metadata&>(Metadata()), sizeof m));
}

TEST(Metadata, SampleTypeFromDescription) {
  // Coding, sign, bits, slot; the type, and the sign after.
  const struct {
    int dataType, dataSigned, bits, stride, type, signedAfter;
  } rows[] = {{201, 1, 16, 2, 1, 1},  {201, 0, 16, 2, 1, 1},  {201, 2, 16, 2, -1, 2}, {201, 1, 24, 3, 2, 1},
              {201, 1, 8, 1, 3, 1},   {201, 2, 8, 1, 4, 2},   {201, 1, 24, 4, 5, 1},  {201, 1, 32, 4, 6, 1},
              {2, 1, 32, 4, 7, 1},    {2, 0, 64, 8, 8, 1},    {2, 1, 24, 4, -1, 1},   {2, 1, 16, 2, -1, 1},
              {201, 1, 64, 8, -1, 1}, {201, 1, 16, 4, -1, 1}, {201, 1, 20, 3, -1, 1}, {210, 1, 16, 2, 1, 1},
              {201, 7, 16, 2, -1, 7}, {201, 1, 0, 0, -1, 1}};
  for (const auto& row : rows) {
    Metadata m = describe(row.dataType, row.dataSigned, row.bits, row.stride);
    m.setSampleTypeNumber(42);
    m.calculateSampleTypeNumber();
    EXPECT_EQ(m.getSampleTypeNumber(), row.type)
        << row.dataType << "/" << row.dataSigned << "/" << row.bits << "/" << row.stride;
    EXPECT_EQ(m.getDataSigned(), row.signedAfter);
  }
  // The integer coding the constructor uses makes a float description an
  // integer one.
  Metadata seven(1, 2, 48000, 7), five(1, 2, 48000, 5);
  seven.calculateSampleTypeNumber();
  five.calculateSampleTypeNumber();
  EXPECT_TRUE(seven.getSampleTypeNumber() == 6 && five.getSampleTypeNumber() == 5);
}

TEST(Metadata, CompressionFormatNames) {
  const struct {
    int32_t dataType;
    const char* text;
  } rows[] = {{2, "FLoating Point"}, {3, "Matrox"},     {131, "MPEG1"},         {132, "MPEG1"},
              {140, "AAC"},          {143, "AAC"},      {150, "Dolby Digital"}, {151, "Dolby Digital Plus"},
              {160, "AMR"},          {165, "WMA"},      {170, "SDDS"},          {172, "DTS"},
              {200, "PCM"},          {201, "PCM"},      {202, "PCM (DVD)"},     {203, "LPCM"},
              {210, "AES"},          {212, "AES"},      {213, "AES"},           {214, "BWF"},
              {230, "PCM (twos)"},   {231, "PCM (QT)"}, {240, "AIFF"},          {241, "PCM (Alaw)"}};
  Metadata m;
  for (const auto& row : rows) {
    m.setDataType(static_cast<Aud::eDataType>(row.dataType));
    EXPECT_STREQ(m.CompressionFormatAsString().c_str(), row.text) << row.dataType;
  }
  for (int32_t unknown : {0, 1, 130, 133, 139, 144, 171, 209, 215, 259, -5, INT32_MAX}) {
    m.setDataType(static_cast<Aud::eDataType>(unknown));
    EXPECT_STREQ(m.CompressionFormatAsString().c_str(), "") << unknown;
  }
}

TEST(Metadata, WritingWaveHeaders) {
  // 2 streams x 3 channels, 48 kHz, 24 bits packed: integer PCM, 6 channels,
  // 48000, 864000 bytes a second, block align 18, 24 bits, extension size 14.
  WavHeaderEx header;
  std::memset(&header, 0xEE, sizeof header);
  Metadata(2, 3, 48000, 2).setWAVFORMATEX(header);
  const uint8_t expected[18] = {0x01, 0x00, 0x06, 0x00, 0x80, 0xBB, 0x00, 0x00, 0x00,
                                0x2F, 0x0D, 0x00, 0x12, 0x00, 0x18, 0x00, 0x0E, 0x00};
  EXPECT_EQ(0, std::memcmp(&header, expected, sizeof expected));
  // Float coding is written as integer PCM all the same. 65536 channels wrap
  // to 0, and the byte rate follows the wrapped count. The byte rate is kept
  // in 32 bits, block align and bits in 16.
  const struct {
    int dataType, bits, stride, streams, channels, rate;
    WavHeaderEx expected;
  } rows[] = {{2, 32, 4, 1, 2, 96000, {1, 2, 96000, 768000, 8, 32, 14}},
              {201, 16, 2, 2, 32768, 48000, {1, 0, 48000, 0, 0, 16, 14}},
              {201, 16, 2, 1, 65537, 48000, {1, 1, 48000, 96000, 2, 16, 14}},
              {201, 32, 4, 1, 40000, 192000, {1, 40000, 192000, 655228928, 28928, 32, 14}},
              {201, 70000, 70000, 1, 1, 1, {1, 1, 1, 70000, 4464, 4464, 14}}};
  for (const auto& row : rows) {
    Metadata m = describe(row.dataType, 1, row.bits, row.stride);
    m.setAudioStreams(row.streams);
    m.setChannelsPerStream(row.channels);
    m.setSamplesPerSec(row.rate);
    WavHeaderEx h{};
    m.setWAVFORMATEX(h);
    EXPECT_EQ(0, std::memcmp(&h, &row.expected, sizeof h)) << row.channels;
  }
}

TEST(Metadata, ReadingAndRoundTrippingWaveHeaders) {
  // The header says nothing of byte order: big-endian stays.
  const struct {
    const char* what;
    WavHeaderEx header;
    int signedBefore, dataType, dataSigned;
    unsigned channels, stride, bits;
    int type;
  } rows[] = {
      {"float stereo", {3, 2, 48000, 384000, 8, 32, 0}, 1, 2, 1, 2, 4, 32, 7},
      {"double stereo", {3, 2, 48000, 768000, 16, 64, 0}, 1, 2, 1, 2, 8, 64, 8},
      {"8-bit mono", {1, 1, 8000, 8000, 1, 8, 0}, 1, 201, 2, 1, 1, 8, 4},
      {"16-bit stereo, unstated sign", {1, 2, 44100, 176400, 4, 16, 0}, 0, 201, 1, 2, 2, 16, 1},
      {"16-bit read over an unsigned description", {1, 2, 44100, 176400, 4, 16, 0}, 2, 201, 2, 2, 2, 16, -1},
      {"24 packed, extensible tag", {0xFFFE, 6, 48000, 864000, 18, 24, 22}, 1, 201, 1, 6, 3, 24, 2},
      {"MPEG layer 3", {0x55, 2, 44100, 16000, 1, 16, 12}, 1, 201, 1, 2, 2, 16, 1},
      {"MPEG", {0x50, 2, 44100, 16000, 1, 0, 22}, 1, 201, 1, 2, 0, 0, -1},
      {"no channels", {1, 0, 48000, 0, 4, 16, 0}, 1, 201, 1, 0, 4, 16, -1},
      {"block align not a multiple", {1, 3, 48000, 0, 7, 16, 0}, 1, 201, 1, 3, 2, 16, 1},
  };
  for (const auto& row : rows) {
    Metadata m;
    m.setDataSigned(static_cast<Aud::eDataSigned>(row.signedBefore));
    m.setEndianType(Aud::eBigEndian);
    m.getFromWAVFORMATEX(row.header, 3);
    EXPECT_EQ(fields(m), std::make_tuple(row.dataType, 1, row.dataSigned, 3u, row.channels,
                                         row.header.nSamplesPerSec, row.type, row.stride, row.bits))
        << row.what;
  }
  // What each sample type reads back as: the header always says integer
  // PCM, and the WAVE format's 8-bit samples are unsigned. Written again,
  // the header is the same.
  const int readBack[] = {5, 1, 2, 4, 4, 5, 6, 6, -1};
  for (int type = 0; type < 9; ++type) {
    WavHeaderEx header, again;
    Metadata(1, 6, 96000, type).setWAVFORMATEX(header);
    Metadata read;
    read.getFromWAVFORMATEX(header, 1);
    EXPECT_EQ(read.getSampleTypeNumber(), readBack[type]) << type;
    read.setWAVFORMATEX(again);
    EXPECT_EQ(0, std::memcmp(&again, &header, sizeof header)) << type;
  }
}

TEST(Metadata, SampleTypeNames) {
  // Read back, a name gives the first type of that exact name, else 0.
  const wchar_t* names[] = {L"24 bit floating point", L"16 bit", L"24 bit",
                            L"8 bit signed",          L"8 bit",  L"24 bit unpacked (4 bytes)",
                            L"32 bit integer",        L"Error",  L"Error"};
  for (int type = 0; type < 9; ++type) {
    EXPECT_EQ(Aud::getAsString(type), WString(names[type])) << type;
    EXPECT_EQ(Aud::sampleTypeFromString(names[type]), type == 8 ? 7 : type);
  }
  for (int type : {-1, 9, 1000}) EXPECT_EQ(Aud::getAsString(type), WString(L"Error"));
  for (const wchar_t* text : {L"24 Bit", L"24 bit ", L""}) EXPECT_EQ(Aud::sampleTypeFromString(text), 0);
  EXPECT_EQ(Aud::getExportChoicesAsInt(), (Vector<int>{1, 2, 5}));
  EXPECT_EQ(Aud::getExportChoices(), (Vector<WString>{L"16 bit", L"24 bit", L"24 bit unpacked (4 bytes)"}));
}

}  // namespace
