#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <string>

#include "tonebits/foundation/Aud__Metadata.h"

namespace {

using Aud::Metadata;

struct Description {
  int32_t dataType, dataSigned;
  unsigned bits, stride;
};

Metadata describe(const Description& d) {
  Metadata m;
  m.setDataType(static_cast<Aud::eDataType>(d.dataType));
  m.setDataSigned(static_cast<Aud::eDataSigned>(d.dataSigned));
  m.setBitsPerSample(d.bits);
  m.setStride(d.stride);
  return m;
}

TEST(Metadata, ConstructorSlotsPerSampleType) {
  struct Row {
    int type;
    unsigned bits, stride;
    int32_t dataSigned;
  };
  const Row rows[] = {{0, 24, 4, 1}, {1, 16, 2, 1}, {2, 24, 3, 1}, {3, 8, 1, 1},  {4, 8, 1, 2}, {5, 24, 4, 1},
                      {6, 32, 4, 1}, {7, 32, 4, 1}, {8, 64, 8, 1}, {-1, 0, 0, 1}, {9, 0, 0, 1}};
  for (const Row& row : rows) {
    const Metadata m(2, 3, 44100, row.type);
    SCOPED_TRACE(row.type);
    EXPECT_EQ(m.getDataType(), Aud::eDataTypePCM);  // even for the floating-point types
    EXPECT_EQ(m.getEndianType(), Aud::eLittleEndian);
    EXPECT_EQ(m.getDataSigned(), row.dataSigned);
    EXPECT_EQ(m.getAudioStreams(), 2u);
    EXPECT_EQ(m.getChannelsPerStream(), 3u);
    EXPECT_EQ(m.getTotalChannels(), 6u);
    EXPECT_EQ(m.getSamplesPerSec(), 44100u);
    EXPECT_EQ(m.getSampleTypeNumber(), row.type);
    EXPECT_EQ(m.getBitsPerSample(), row.bits);
    EXPECT_EQ(m.getStride(), row.stride);
    EXPECT_EQ(m.getBytesPerSample(), row.bits / 8);
  }
  Metadata m(1, 2, 48000, 5);
  m.invalidate();
  EXPECT_EQ(0, std::memcmp(&m, &static_cast<const Metadata&>(Metadata()), sizeof m));
  EXPECT_EQ(m.getSampleTypeNumber(), 0);
}

TEST(Metadata, SampleTypeFromDescription) {
  struct Row {
    Description d;
    int type;
    int32_t signedAfter;
  };
  const Row rows[] = {
      {{201, 1, 16, 2}, 1, 1},  {{201, 0, 16, 2}, 1, 1},  {{201, 2, 16, 2}, -1, 2}, {{201, 1, 24, 3}, 2, 1},
      {{201, 1, 8, 1}, 3, 1},   {{201, 2, 8, 1}, 4, 2},   {{201, 1, 24, 4}, 5, 1},  {{201, 1, 32, 4}, 6, 1},
      {{2, 1, 32, 4}, 7, 1},    {{2, 0, 64, 8}, 8, 1},    {{2, 1, 24, 4}, -1, 1},   {{2, 1, 16, 2}, -1, 1},
      {{201, 1, 64, 8}, -1, 1}, {{201, 1, 16, 4}, -1, 1}, {{201, 1, 20, 3}, -1, 1}, {{210, 1, 16, 2}, 1, 1},
      {{201, 7, 16, 2}, -1, 7}, {{201, 1, 0, 0}, -1, 1},
  };
  for (const Row& row : rows) {
    Metadata m = describe(row.d);
    m.setSampleTypeNumber(42);
    m.calculateSampleTypeNumber();
    EXPECT_EQ(m.getSampleTypeNumber(), row.type)
        << row.d.dataType << "/" << row.d.dataSigned << "/" << row.d.bits << "/" << row.d.stride;
    EXPECT_EQ(m.getDataSigned(), row.signedAfter);
  }
  // The integer coding the constructor uses makes a float description an
  // integer one.
  Metadata seven(1, 2, 48000, 7);
  seven.calculateSampleTypeNumber();
  EXPECT_EQ(seven.getSampleTypeNumber(), 6);
  Metadata five(1, 2, 48000, 5);
  five.calculateSampleTypeNumber();
  EXPECT_EQ(five.getSampleTypeNumber(), 5);
}

TEST(Metadata, CompressionFormatNames) {
  struct Row {
    int32_t dataType;
    const char* text;
  };
  const Row rows[] = {
      {2, "FLoating Point"},
      {3, "Matrox"},
      {131, "MPEG1"},
      {132, "MPEG1"},
      {140, "AAC"},
      {143, "AAC"},
      {150, "Dolby Digital"},
      {151, "Dolby Digital Plus"},
      {160, "AMR"},
      {165, "WMA"},
      {170, "SDDS"},
      {172, "DTS"},
      {200, "PCM"},
      {201, "PCM"},
      {202, "PCM (DVD)"},
      {203, "LPCM"},
      {210, "AES"},
      {212, "AES"},
      {213, "AES"},
      {214, "BWF"},
      {230, "PCM (twos)"},
      {231, "PCM (QT)"},
      {240, "AIFF"},
      {241, "PCM (Alaw)"},
      {0, ""},
      {1, ""},
      {130, ""},
      {133, ""},
      {139, ""},
      {144, ""},
      {171, ""},
      {209, ""},
      {215, ""},
      {259, ""},
      {-5, ""},
      {INT32_MAX, ""},
  };
  for (const Row& row : rows) {
    Metadata m;
    m.setDataType(static_cast<Aud::eDataType>(row.dataType));
    EXPECT_STREQ(m.CompressionFormatAsString().c_str(), row.text) << row.dataType;
  }
}

TEST(Metadata, WaveHeaderBytesAsStoredInAFile) {
  // 2 streams x 3 channels, 48 kHz, 24 bits packed.
  Metadata m(2, 3, 48000, 2);
  WavHeaderEx header;
  std::memset(&header, 0xEE, sizeof header);
  m.setWAVFORMATEX(header);
  const uint8_t expected[18] = {
      0x01, 0x00,              // integer PCM
      0x06, 0x00,              // 6 channels
      0x80, 0xBB, 0x00, 0x00,  // 48000
      0x00, 0x2F, 0x0D, 0x00,  // 864000 bytes a second
      0x12, 0x00,              // block align 18
      0x18, 0x00,              // 24 bits
      0x0E, 0x00,              // extension size 14
  };
  EXPECT_EQ(sizeof(WavHeaderEx), 18u);
  EXPECT_EQ(0, std::memcmp(&header, expected, sizeof expected));
}

TEST(Metadata, WaveHeaderFieldsTakeTheLowBits) {
  struct Row {
    Description d;
    unsigned streams, channels, rate;
    uint16_t nChannels;
    uint32_t avgBytes;
    uint16_t blockAlign, bits;
  };
  const Row rows[] = {
      // Float coding is written as integer PCM all the same.
      {{2, 1, 32, 4}, 1, 2, 96000, 2, 768000, 8, 32},
      // 65536 channels wrap to 0, and the byte rate follows the wrapped count.
      {{201, 1, 16, 2}, 2, 32768, 48000, 0, 0, 0, 16},
      {{201, 1, 16, 2}, 1, 65537, 48000, 1, 96000, 2, 16},
      // Byte rate in 32 bits: 40000 x 192000 x 4 wraps.
      {{201, 1, 32, 4}, 1, 40000, 192000, 40000, uint32_t(40000ull * 192000 * 4), uint16_t(160000), 32},
      {{201, 1, 70000, 70000}, 1, 1, 1, 1, 70000, uint16_t(70000), uint16_t(70000)},
  };
  for (const Row& row : rows) {
    Metadata m = describe(row.d);
    m.setAudioStreams(row.streams);
    m.setChannelsPerStream(row.channels);
    m.setSamplesPerSec(row.rate);
    WavHeaderEx h{};
    m.setWAVFORMATEX(h);
    SCOPED_TRACE(row.channels);
    EXPECT_EQ(h.wFormatTag, 1);
    EXPECT_EQ(h.nChannels, row.nChannels);
    EXPECT_EQ(h.nSamplesPerSec, row.rate);
    EXPECT_EQ(h.nAvgBytesPerSec, row.avgBytes);
    EXPECT_EQ(h.nBlockAlign, row.blockAlign);
    EXPECT_EQ(h.wBitsPerSample, row.bits);
    EXPECT_EQ(h.cbSize, 14);
  }
}

TEST(Metadata, ReadingWaveHeaders) {
  struct Row {
    const char* what;
    WavHeaderEx header;
    int32_t signedBefore;
    int32_t dataType, dataSigned;
    unsigned channels, stride, bits;
    int type;
  };
  const Row rows[] = {
      {"float stereo", {3, 2, 48000, 384000, 8, 32, 0}, 1, 2, 1, 2, 4, 32, 7},
      {"double stereo", {3, 2, 48000, 768000, 16, 64, 0}, 1, 2, 1, 2, 8, 64, 8},
      {"8-bit mono", {1, 1, 8000, 8000, 1, 8, 0}, 1, 201, 2, 1, 1, 8, 4},
      {"16-bit stereo, unstated sign", {1, 2, 44100, 176400, 4, 16, 0}, 0, 201, 1, 2, 2, 16, 1},
      {"16-bit read over an unsigned description", {1, 2, 44100, 176400, 4, 16, 0}, 2, 201, 2, 2, 2, 16, -1},
      {"24 in 4 bytes", {1, 2, 48000, 384000, 8, 24, 0}, 1, 201, 1, 2, 4, 24, 5},
      {"24 packed, extensible tag", {0xFFFE, 6, 48000, 864000, 18, 24, 22}, 1, 201, 1, 6, 3, 24, 2},
      {"MPEG layer 3", {0x55, 2, 44100, 16000, 1, 16, 12}, 1, 201, 1, 2, 2, 16, 1},
      {"MPEG", {0x50, 2, 44100, 16000, 1, 0, 22}, 1, 201, 1, 2, 0, 0, -1},
      {"no channels", {1, 0, 48000, 0, 4, 16, 0}, 1, 201, 1, 0, 4, 16, -1},
      {"block align not a multiple", {1, 3, 48000, 0, 7, 16, 0}, 1, 201, 1, 3, 2, 16, 1},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    Metadata m;
    m.setDataSigned(static_cast<Aud::eDataSigned>(row.signedBefore));
    m.setEndianType(Aud::eBigEndian);
    m.getFromWAVFORMATEX(row.header, 3);
    EXPECT_EQ(m.getDataType(), row.dataType);
    EXPECT_EQ(m.getDataSigned(), row.dataSigned);
    EXPECT_EQ(m.getAudioStreams(), 3u);
    EXPECT_EQ(m.getChannelsPerStream(), row.channels);
    EXPECT_EQ(m.getSamplesPerSec(), row.header.nSamplesPerSec);
    EXPECT_EQ(m.getStride(), row.stride);
    EXPECT_EQ(m.getBitsPerSample(), row.bits);
    EXPECT_EQ(m.getSampleTypeNumber(), row.type);
    EXPECT_EQ(m.getEndianType(), Aud::eBigEndian);  // the header says nothing of byte order
  }
}

TEST(Metadata, RoundTripThroughTheWaveHeader) {
  // What each sample type reads back as: the header always says integer
  // PCM, and the WAVE format's 8-bit samples are unsigned.
  const int readBack[] = {5, 1, 2, 4, 4, 5, 6, 6, -1};
  for (int type = 0; type < 9; ++type) {
    const Metadata written(1, 6, 96000, type);
    WavHeaderEx header;
    written.setWAVFORMATEX(header);
    Metadata read;
    read.getFromWAVFORMATEX(header, 1);
    SCOPED_TRACE(type);
    EXPECT_EQ(read.getSampleTypeNumber(), readBack[type]);
    EXPECT_EQ(read.getChannelsPerStream(), 6u);
    EXPECT_EQ(read.getStride(), written.getStride());
    EXPECT_EQ(read.getBitsPerSample(), written.getBitsPerSample());
    EXPECT_EQ(read.getSamplesPerSec(), 96000u);
    WavHeaderEx again;
    read.setWAVFORMATEX(again);
    EXPECT_EQ(0, std::memcmp(&again, &header, sizeof header));
  }
}

TEST(Metadata, SampleTypeNames) {
  const wchar_t* names[] = {L"24 bit floating point", L"16 bit", L"24 bit",
                            L"8 bit signed",          L"8 bit",  L"24 bit unpacked (4 bytes)",
                            L"32 bit integer",        L"Error",  L"Error"};
  for (int type = 0; type < 9; ++type) EXPECT_EQ(Aud::getAsString(type), WString(names[type])) << type;
  for (int type : {-1, 9, 1000}) EXPECT_EQ(Aud::getAsString(type), WString(L"Error"));

  struct Row {
    const wchar_t* text;
    int type;
  };
  const Row rows[] = {{L"24 bit", 2},
                      {L"24 Bit", 0},
                      {L"Error", 7},
                      {L"16 bit", 1},
                      {L"8 bit", 4},
                      {L"8 bit signed", 3},
                      {L"24 bit unpacked (4 bytes)", 5},
                      {L"32 bit integer", 6},
                      {L"24 bit floating point", 0},
                      {L"24 bit ", 0},
                      {L"", 0}};
  for (const Row& row : rows)
    EXPECT_EQ(Aud::sampleTypeFromString(row.text), row.type) << std::wstring(row.text).size();
  EXPECT_EQ(Aud::sampleTypeFromString(WString(L"24 bit")), 2);

  EXPECT_EQ(Aud::getExportChoicesAsInt(), (Vector<int>{1, 2, 5}));
  const Vector<WString> choices = Aud::getExportChoices();
  ASSERT_EQ(choices.size(), 3u);
  EXPECT_EQ(choices[0], L"16 bit");
  EXPECT_EQ(choices[1], L"24 bit");
  EXPECT_EQ(choices[2], L"24 bit unpacked (4 bytes)");
}

}  // namespace
