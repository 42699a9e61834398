#include "tonebits/foundation/Aud__Metadata.h"

#include <iterator>
#include <type_traits>

namespace Aud {

static_assert(sizeof(Metadata) == 36, "nine 32-bit fields");
static_assert(std::is_standard_layout_v<Metadata>);

namespace {

constexpr uint16_t kWaveFormatPCM = 1;
constexpr uint16_t kWaveFormatIEEEFloat = 3;
constexpr uint16_t kWaveFormatMPEG = 0x50;
constexpr uint16_t kWaveFormatMPEGLayer3 = 0x55;
// What setWAVFORMATEX always writes as the size of the extension.
constexpr uint16_t kHeaderExtensionSize = 14;

struct SlotOfType {
  unsigned bits, stride;
};
// Indexed by sample type number. Type 0 is a float, but its description
// carries 24 significant bits in a 4-byte slot.
constexpr SlotOfType kSlotOfType[] = {{24, 4}, {16, 2}, {24, 3}, {8, 1}, {8, 1},
                                      {24, 4}, {32, 4}, {32, 4}, {64, 8}};

// The rows that calculateSampleTypeNumber tries, in order of the number
// they give. Packing follows from bits and stride, so it needs no column.
struct TypeRule {
  int number;
  unsigned bits, stride;
  eDataSigned signedness;
  bool floatingPoint;
};
constexpr TypeRule kTypeRules[] = {
    {1, 16, 2, eSigned, false},  {2, 24, 3, eSigned, false}, {3, 8, 1, eSigned, false},
    {4, 8, 1, eUnsigned, false}, {5, 24, 4, eSigned, false}, {6, 32, 4, eSigned, false},
    {7, 32, 4, eSigned, true},   {8, 64, 8, eSigned, true},
};

const wchar_t* const kSampleTypeNames[] = {
    L"24 bit floating point",     L"16 bit",         L"24 bit", L"8 bit signed", L"8 bit",
    L"24 bit unpacked (4 bytes)", L"32 bit integer", L"Error",  L"Error",
};
constexpr int kNumNamedTypes = sizeof(kSampleTypeNames) / sizeof(kSampleTypeNames[0]);

constexpr int kExportChoices[] = {1, 2, 5};

}  // namespace

Metadata::Metadata(unsigned int streams, unsigned int channels, unsigned int rate, int type) noexcept
    : dataType(eDataTypePCM),
      endianType(eLittleEndian),
      dataSigned(eSigned),
      audioStreams(streams),
      channelsPerStream(channels),
      samplesPerSec(rate),
      sampleTypeNumber(type) {
  if (type < 0 || type >= int(sizeof(kSlotOfType) / sizeof(kSlotOfType[0]))) return;
  bitsPerSample = kSlotOfType[type].bits;
  stride = kSlotOfType[type].stride;
  if (type == 4) dataSigned = eUnsigned;
}

void Metadata::calculateSampleTypeNumber() noexcept {
  sampleTypeNumber = -1;
  if (dataSigned == eSignednessNotStated) dataSigned = eSigned;
  const bool floatingPoint = dataType == eDataTypeFloatingPoint;
  for (const TypeRule& rule : kTypeRules) {
    if (rule.bits == bitsPerSample && rule.stride == stride && rule.signedness == dataSigned &&
        rule.floatingPoint == floatingPoint) {
      sampleTypeNumber = rule.number;
      return;
    }
  }
}

String Metadata::CompressionFormatAsString() const {
  const int32_t v = dataType;
  if (v == 2) return "FLoating Point";
  if (v == 3) return "Matrox";
  if (v == 131 || v == 132) return "MPEG1";
  if (v >= 140 && v <= 143) return "AAC";
  if (v == 150) return "Dolby Digital";
  if (v == 151) return "Dolby Digital Plus";
  if (v == 160) return "AMR";
  if (v == 165) return "WMA";
  if (v == 170) return "SDDS";
  if (v == 172) return "DTS";
  if (v == 200 || v == 201) return "PCM";
  if (v == 202) return "PCM (DVD)";
  if (v == 203) return "LPCM";
  if (v >= 210 && v <= 213) return "AES";
  if (v == 214) return "BWF";
  if (v == 230) return "PCM (twos)";
  if (v == 231) return "PCM (QT)";
  if (v == 240) return "AIFF";
  if (v == 241) return "PCM (Alaw)";
  return String();
}

void Metadata::setWAVFORMATEX(WavHeaderEx& header) const noexcept {
  // The header's fields are narrower than ours: each takes the low bits,
  // and the byte rate is worked out from the narrowed channel count.
  const uint16_t channels = uint16_t(channelsPerStream * audioStreams);
  header.wFormatTag = kWaveFormatPCM;
  header.nChannels = channels;
  header.nSamplesPerSec = samplesPerSec;
  header.nAvgBytesPerSec = uint32_t(channels) * samplesPerSec * stride;
  header.nBlockAlign = uint16_t(stride * channels);
  header.wBitsPerSample = uint16_t(bitsPerSample);
  header.cbSize = kHeaderExtensionSize;
}

void Metadata::getFromWAVFORMATEX(const WavHeaderEx& header, unsigned int streams) noexcept {
  // The WAVE format stores 8-bit samples unsigned.
  if (header.wBitsPerSample == 8) dataSigned = eUnsigned;
  audioStreams = streams;
  channelsPerStream = header.nChannels;
  stride = header.nChannels ? header.nBlockAlign / header.nChannels : header.nBlockAlign;
  bitsPerSample = header.wBitsPerSample;
  samplesPerSec = header.nSamplesPerSec;
  switch (header.wFormatTag) {
    case kWaveFormatIEEEFloat: dataType = eDataTypeFloatingPoint; break;
    case kWaveFormatMPEG:
    case kWaveFormatMPEGLayer3:
      // Compressed frames: the block align says nothing about the samples.
      stride = bitsPerSample / 8;
      dataType = eDataTypePCM;
      break;
    default: dataType = eDataTypePCM; break;
  }
  calculateSampleTypeNumber();
}

WString getAsString(int sampleTypeNumber) {
  const bool named = sampleTypeNumber >= 0 && sampleTypeNumber < kNumNamedTypes;
  return WString(named ? kSampleTypeNames[sampleTypeNumber] : L"Error");
}

int sampleTypeFromString(std::wstring_view text) {
  for (int type = 0; type < kNumNamedTypes; ++type)
    if (text == kSampleTypeNames[type]) return type;
  return 0;
}

Vector<int> getExportChoicesAsInt() {
  return Vector<int>(std::begin(kExportChoices), std::end(kExportChoices));
}

Vector<WString> getExportChoices() {
  Vector<WString> names;
  names.reserve(std::size(kExportChoices));
  for (int type : kExportChoices) names.push_back(getAsString(type));
  return names;
}

}  // namespace Aud
