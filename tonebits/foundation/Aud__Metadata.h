// Audio format metadata: Aud::Metadata describes a stream of audio as
// importers, exporters and devices see it (coding, byte order, signedness,
// channel layout, rate, slot and sample size) and ties it to a stored sample
// form through its sample type number (-1 when the format has none).
//
// It converts to and from the WAVE format header, WavHeaderEx, which is kept
// exactly as it is stored in a file: 18 bytes, packed, little-endian.
//
// The free functions at the end name the sample types for the export
// dialogue and read such a name back.
#pragma once

#include <bit>
#include <cstdint>
#include <string_view>

#include "host/String.h"
#include "host/Vector.h"
#include "tonebits/export.h"

static_assert(std::endian::native == std::endian::little,
              "WavHeaderEx is read and written in place as little-endian");

// The WAVE format header as stored in a file.
struct __attribute__((packed)) WavHeaderEx {
  uint16_t wFormatTag;
  uint16_t nChannels;
  uint32_t nSamplesPerSec;
  uint32_t nAvgBytesPerSec;
  uint16_t nBlockAlign;
  uint16_t wBitsPerSample;
  uint16_t cbSize;
};
static_assert(sizeof(WavHeaderEx) == 18, "WavHeaderEx must match the stored header byte for byte");

namespace Aud {

// Codings. Only the values the library acts on are named; every other
// 32-bit value is a coding too (see CompressionFormatAsString).
enum eDataType : int32_t {
  eDataTypeNone = 0,
  eDataTypeFloatingPoint = 2,
  eDataTypePCM = 201,
  eDataTypeAES = 210,
};

// Only the difference between 0 and not 0 matters.
enum eEndianType : int32_t { eLittleEndian = 0, eBigEndian = 1 };

enum eDataSigned : int32_t { eSignednessNotStated = 0, eSigned = 1, eUnsigned = 2 };

class TONEBITS_API Metadata {
 public:
  // Every field 0.
  Metadata() noexcept = default;
  // Integer PCM, little-endian, signed, with the slot and bit sizes of the
  // sample type (a type outside 0 to 8 sets neither).
  Metadata(unsigned int audioStreams, unsigned int channelsPerStream, unsigned int samplesPerSec,
           int sampleTypeNumber) noexcept;

  // Every field 0.
  void invalidate() noexcept { *this = Metadata(); }

  eDataType getDataType() const noexcept { return dataType; }
  void setDataType(eDataType v) noexcept { dataType = v; }
  eEndianType getEndianType() const noexcept { return endianType; }
  void setEndianType(eEndianType v) noexcept { endianType = v; }
  eDataSigned getDataSigned() const noexcept { return dataSigned; }
  void setDataSigned(eDataSigned v) noexcept { dataSigned = v; }
  unsigned int getAudioStreams() const noexcept { return audioStreams; }
  void setAudioStreams(unsigned int v) noexcept { audioStreams = v; }
  unsigned int getChannelsPerStream() const noexcept { return channelsPerStream; }
  void setChannelsPerStream(unsigned int v) noexcept { channelsPerStream = v; }
  unsigned int getSamplesPerSec() const noexcept { return samplesPerSec; }
  void setSamplesPerSec(unsigned int v) noexcept { samplesPerSec = v; }
  int getSampleTypeNumber() const noexcept { return sampleTypeNumber; }
  void setSampleTypeNumber(int v) noexcept { sampleTypeNumber = v; }
  unsigned int getStride() const noexcept { return stride; }
  void setStride(unsigned int v) noexcept { stride = v; }
  unsigned int getBitsPerSample() const noexcept { return bitsPerSample; }
  void setBitsPerSample(unsigned int v) noexcept { bitsPerSample = v; }

  // channelsPerStream x audioStreams, in 32 bits.
  unsigned int getTotalChannels() const noexcept { return channelsPerStream * audioStreams; }
  // Significant bytes of a sample: bitsPerSample / 8, rounded down.
  unsigned int getBytesPerSample() const noexcept { return bitsPerSample / 8; }

  // Derives sampleTypeNumber from the coding, signedness, bits and slot;
  // -1 when no stored form matches. An unstated signedness becomes signed.
  void calculateSampleTypeNumber() noexcept;

  // The display name of the coding; empty for an unknown one.
  String CompressionFormatAsString() const;

  // Fills a WAVE header for this format (always tagged integer PCM).
  void setWAVFORMATEX(WavHeaderEx& header) const noexcept;
  // Reads a WAVE header describing audioStreams streams.
  void getFromWAVFORMATEX(const WavHeaderEx& header, unsigned int audioStreams) noexcept;

 private:
  eDataType dataType = eDataTypeNone;
  eEndianType endianType = eLittleEndian;
  eDataSigned dataSigned = eSignednessNotStated;
  unsigned int audioStreams = 0;
  unsigned int channelsPerStream = 0;
  unsigned int samplesPerSec = 0;
  int sampleTypeNumber = 0;
  unsigned int stride = 0;
  unsigned int bitsPerSample = 0;
};

// The export dialogue's name of a sample type; "Error" for 7, 8 and any
// number that is not a sample type.
TONEBITS_API WString getAsString(int sampleTypeNumber);
// The first sample type (0 to 8) whose name equals text exactly; 0 when none.
TONEBITS_API int sampleTypeFromString(std::wstring_view text);
// The sample types offered for export, in order: 1, 2, 5.
TONEBITS_API Vector<int> getExportChoicesAsInt();
// Their names, in the same order.
TONEBITS_API Vector<WString> getExportChoices();

}  // namespace Aud
