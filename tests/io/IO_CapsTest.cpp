#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <utility>
#include <vector>

#include "host/HostHooks.h"
#include "tonebits/io/Aud__IO_Caps.h"

namespace {

using namespace Aud;
using Texts = std::vector<std::string>;

struct FatalReports {
  Texts got;
  FatalReports() {
    host::setFatalReportHandler([&](const char* m) { got.push_back(m); });
  }
  ~FatalReports() { host::setFatalReportHandler(nullptr); }
  Texts take() { return std::exchange(got, {}); }
};

IO_ConnectionTypeInfo::Rep record(eIO_ConnectionClass cc, eIO_ConnectionType type, bool src = false,
                                  bool absolute = true, double lower = 0, double upper = 0) {
  return {true, -12.5, 6.0, absolute, lower, upper, src, String("SRC text"), cc, type};
}
IO_ConnectionTypeInfo info(const IO_ConnectionTypeInfo::Rep& rep) {
  return IO_CapsFactory::makeConnectionTypeInfo(rep);
}

TEST(IO_ConnectionTypeInfo, CopiesShareTheRecordAndAnInvalidOneReportsEveryQueryButType) {
  const IO_ConnectionTypeInfo::Rep rep = record(ccMixer, ctADAT, true);
  IO_ConnectionTypeInfo copy;
  copy = info(rep);
  EXPECT_TRUE(copy.supportsGainControl() && copy.supportsSRC() && copy.isMixer());
  EXPECT_FALSE(copy.isAnalogue() || copy.isDigital());
  EXPECT_TRUE(copy.mininumGain() == -12.5 && copy.maximumGain() == 6.0);
  EXPECT_EQ(copy.getDisplayString(), L"ADAT");
  EXPECT_EQ(copy.getSRCDisplayString(), L"SRC text");

  FatalReports reports;
  const IO_ConnectionTypeInfo invalid = IO_CapsFactory::makeConnectionTypeInfo(nullptr);
  EXPECT_TRUE(invalid.type() == ctNone && IO_ConnectionTypeInfo().type() == ctNone);
  EXPECT_TRUE(reports.take().empty());
  EXPECT_FALSE(invalid.supportsGainControl() || invalid.supportsSRC() || invalid.isAnalogue() ||
               invalid.isDigital() || invalid.isMixer() ||
               invalid.supportsSRC({sr48000, fNone}, {sr48000, fNone}));
  EXPECT_EQ(invalid.mininumGain() + invalid.maximumGain(), 0.0);
  EXPECT_EQ(invalid.getConnectionClass(), 0);
  EXPECT_EQ(invalid.getDisplayString(), L"Invalid");
  EXPECT_EQ(invalid.getSRCDisplayString(), L"");
  EXPECT_EQ(reports.take(), Texts(11, "Method called on invalid IO_ConnectionTypeInfo object"));
}

TEST(IO_ConnectionTypeInfo, SupportsSRCWithinInclusiveBounds) {
  // In Hz: 32000, 44100, 48000, 96000, 48048, 47952.05, 50000, 42336, 24000, 25000, 96000, 96096, none.
  const SampleRate rates[] = {
      {sr32000, fNone},    {sr44100, fNone},        {sr48000, fNone},   {sr96000, fNone}, {sr48000, fx1001},
      {sr48000, fx1_1001}, {sr48000, fx25_24},      {sr44100, fx24_25}, {sr48000, fx1_2}, {sr24000, fx25_24},
      {sr48000, fx2},      {sr48000, fx2 | fx1001}, {srNone, fNone}};
  // Absolute bounds ignore the reference: 44100 to 48000 Hz at 48 or 96 kHz. Relative ones are 43200 to
  // 52800 Hz at 48 kHz, 21600 to 26400 Hz at 24 kHz, and 24000 to 96000 Hz at 48 kHz, inclusive.
  const struct {
    IO_ConnectionTypeInfo::Rep rep;
    SampleRate reference;
    const char* supported;
  } rows[] = {{record(ccDigital, ctAES_EBU, true, true, 44100.0, 48000.0), {sr48000, fNone}, "-++--+-------"},
              {record(ccDigital, ctAES_EBU, true, true, 44100.0, 48000.0), {sr96000, fNone}, "-++--+-------"},
              {record(ccDigital, ctSPDIF, true, false, 0.1, 0.1), {sr48000, fNone}, "-++-+++------"},
              {record(ccDigital, ctSPDIF, true, false, 0.1, 0.1), {sr24000, fNone}, "--------++---"},
              {record(ccDigital, ctHDMI, true, false, 0.5, 1.0), {sr48000, fNone}, "+++++++++++--"},
              {record(ccDigital, ctSDI, false, true, 0.0, 1e9), {sr48000, fNone}, "-------------"},
              {record(ccAnalogue, ctAnalogue), {sr48000, fNone}, "+++++++++++++"},
              {record(ccMixer, ctNone), {sr48000, fNone}, "+++++++++++++"},
              {record(ccDigital, ctAES_EBU, true, false, NAN, 0.1), {sr48000, fNone}, "-------------"}};
  for (const auto& row : rows) {
    std::string got;
    for (const SampleRate& rate : rates) got += info(row.rep).supportsSRC(row.reference, rate) ? '+' : '-';
    EXPECT_EQ(got, row.supported) << row.rep.connectionType << " at "
                                  << row.reference.calcCombinedSampleRate();
  }
}

TEST(IO_DisplayStrings, TypesAndSyncSourcesIncludingUnknownValuesAndSyncSourceValues) {
  const std::pair<int, const wchar_t*> connections[] = {{2, L"Analogue"}, {3, L"AES/EBU"},  {4, L"1394"},
                                                        {5, L"ADAT"},     {6, L"S/PDIF"},   {7, L"SDI"},
                                                        {9, L"HDMI"},     {8, L"Invalid"},  {0, L"Invalid"},
                                                        {1, L"Invalid"},  {10, L"Invalid"}, {-2, L"Invalid"}};
  const std::pair<int, const wchar_t*> syncs[] = {
      {1, L"Free Running"}, {2, L"Video"}, {3, L"LTC"}, {4, L"AES/EBU"}, {0, L""}, {5, L""}, {-1, L""},
      {1000, L""}};
  FatalReports reports;
  for (const auto& [type, text] : connections)
    EXPECT_EQ(getDisplayString(eIO_ConnectionType(type)), text) << type;
  EXPECT_TRUE(reports.take().empty());
  for (const auto& [type, text] : syncs) {
    EXPECT_EQ(getDisplayString(eIO_SyncSourceType(type)), text) << type;
    EXPECT_EQ(reports.take(), *text ? Texts{} : Texts{"Dodgy enum!"}) << type;
  }
  host::setResourceText(2081, L"SDI (embedded)");
  EXPECT_EQ(getDisplayString(ctSDI), L"SDI (embedded)");
  host::setResourceText(2081, L"SDI");

  const struct {
    eIO_SyncSourceType type;
    unsigned input;
    const wchar_t* text;
  } rows[] = {{ssAES_EBU, 0, L"AES/EBU 1&2"},         {ssAES_EBU, 1, L"AES/EBU 3&4"},
              {ssAES_EBU, 7, L"AES/EBU 3&4"},         {ssVideo, 0, L"Video 1"},
              {ssFreeRunning, 2, L"Free Running 3"},  {ssLTC, 0xFFFFFFFF, L"LTC 0"},
              {ssLTC, 0x7FFFFFFF, L"LTC 2147483648"}, {ssVideo, 0xFFFFFFFE, L"Video 4294967295"}};
  for (const auto& row : rows) EXPECT_EQ(IO_SyncSource(row.type, row.input).getDisplayString(), row.text);
  EXPECT_EQ(IO_SyncSource().getDisplayString(), L" 0");
  EXPECT_EQ(reports.take(), Texts{"Dodgy enum!"});

  IO_SyncSource source(ssVideo, 3), copy(source);
  EXPECT_EQ(copy, source);
  EXPECT_EQ(copy.inputNumber(7), sSuccess);
  EXPECT_EQ(copy.type(eIO_SyncSourceType(99)), sSuccess);  // any value is taken
  EXPECT_EQ(source.inputNumber(), 3u);                     // copies have their own record
  source = copy;
  copy.reset();
  EXPECT_TRUE(source.type() == eIO_SyncSourceType(99) && source.inputNumber() == 7u);
  EXPECT_EQ(copy, IO_SyncSource());
  EXPECT_FALSE(copy == source);
}

TEST(AudCapsVector, LooksUpByType) {
  const auto a = record(ccDigital, ct1394), b = record(ccAnalogue, ctAnalogue), c = record(ccDigital, ct1394);
  using Caps = AudCapsVector<IO_ConnectionTypeInfo, eIO_ConnectionType>;
  Caps caps, assigned;
  EXPECT_TRUE(caps.find(ct1394) == 0 && caps[ct1394].type() == ctNone);
  for (const auto* rep : {&b, &a, &c}) caps.push_back(info(*rep));
  EXPECT_EQ(caps.find(ct1394), 1u);  // the first of that type
  EXPECT_EQ(caps.find(ctAnalogue), 0u);
  EXPECT_EQ(caps.find(ctHDMI), caps.size());
  EXPECT_EQ(caps[ctHDMI].type(), ctNone);  // an invalid info
  EXPECT_TRUE(caps[ct1394].isDigital() && caps.at(0).isAnalogue());
  assigned = caps;
  EXPECT_EQ(assigned.find(ct1394), 1u);
  const std::vector<IO_ConnectionTypeInfo, StdAllocator<IO_ConnectionTypeInfo>> plain(2, caps[ct1394]);
  EXPECT_EQ(Caps(plain).find(ct1394), 0u);

  const IO_SyncSourceTypeInfo::Rep video{1, ssVideo}, aes{2, ssAES_EBU};
  AudCapsVector<IO_SyncSourceTypeInfo, eIO_SyncSourceType> sync;
  for (const auto* rep : {&video, &aes}) sync.push_back(IO_CapsFactory::makeSyncSourceTypeInfo(*rep));
  EXPECT_EQ(sync.find(ssAES_EBU), 1u);
  EXPECT_EQ(sync[ssAES_EBU].numInputs(), 2u);
  EXPECT_EQ(sync.find(ssLTC), 2u);
  FatalReports reports;
  EXPECT_EQ(sync[ssLTC].type(), ssNone);  // an invalid info, whose type alone is not reported
  EXPECT_EQ(IO_CapsFactory::makeSyncSourceTypeInfo(nullptr).type(), ssNone);
  EXPECT_TRUE(reports.take().empty());
  EXPECT_EQ(sync[ssLTC].numInputs(), 0u);
  EXPECT_EQ(reports.take(), Texts{"Method called on invalid IO_SyncSourceTypeInfo object"});
}

}  // namespace
