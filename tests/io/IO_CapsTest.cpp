#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <utility>
#include <vector>

#include "host/HostHooks.h"
#include "tonebits/io/Aud__IO_Caps.h"

namespace {

using namespace Aud;

class FatalReports {
 public:
  FatalReports() {
    host::setFatalReportHandler([this](const char* m) { messages_.push_back(m); });
  }
  ~FatalReports() { host::setFatalReportHandler(nullptr); }
  std::vector<std::string> take() { return std::exchange(messages_, {}); }

 private:
  std::vector<std::string> messages_;
};

IO_ConnectionTypeInfo::Rep record(eIO_ConnectionClass connectionClass, eIO_ConnectionType type,
                                  bool src = false, bool absolute = true, double lower = 0.0,
                                  double upper = 0.0) {
  return IO_ConnectionTypeInfo::Rep{
      true, -12.5, 6.0, absolute, lower, upper, src, String("SRC text"), connectionClass, type};
}

const SampleRate k32(sr32000, fNone), k44(sr44100, fNone), k48(sr48000, fNone), k96(sr96000, fNone);

TEST(IO_ConnectionTypeInfo, CopiesShareTheRecord) {
  const IO_ConnectionTypeInfo::Rep rep = record(ccMixer, ctADAT, true);
  IO_ConnectionTypeInfo copy;
  copy = IO_CapsFactory::makeConnectionTypeInfo(rep);
  EXPECT_TRUE(copy.supportsGainControl() && copy.supportsSRC() && copy.isMixer());
  EXPECT_FALSE(copy.isAnalogue() || copy.isDigital());
  EXPECT_EQ(copy.mininumGain(), -12.5);
  EXPECT_EQ(copy.maximumGain(), 6.0);
  EXPECT_EQ(copy.type(), ctADAT);
  EXPECT_EQ(copy.getDisplayString(), L"ADAT");
  EXPECT_EQ(copy.getSRCDisplayString(), L"SRC text");
}

TEST(IO_ConnectionTypeInfo, AnInvalidInfoReportsEveryQueryButType) {
  FatalReports reports;
  const IO_ConnectionTypeInfo info;
  EXPECT_EQ(info.type(), ctNone);
  EXPECT_TRUE(reports.take().empty());
  EXPECT_EQ(IO_CapsFactory::makeConnectionTypeInfo(nullptr).type(), ctNone);

  EXPECT_FALSE(info.supportsGainControl());
  EXPECT_EQ(info.mininumGain(), 0.0);
  EXPECT_EQ(info.maximumGain(), 0.0);
  EXPECT_FALSE(info.supportsSRC());
  EXPECT_EQ(info.getConnectionClass(), 0);
  EXPECT_FALSE(info.isAnalogue());
  EXPECT_FALSE(info.isDigital());
  EXPECT_FALSE(info.isMixer());
  EXPECT_FALSE(info.supportsSRC(k48, k48));
  EXPECT_EQ(info.getDisplayString(), L"Invalid");
  EXPECT_EQ(info.getSRCDisplayString(), L"");
  const std::vector<std::string> messages = reports.take();
  EXPECT_EQ(messages.size(), 11u);
  for (const std::string& m : messages) EXPECT_EQ(m, "Method called on invalid IO_ConnectionTypeInfo object");
}

TEST(IO_ConnectionTypeInfo, SupportsSRC) {
  const IO_ConnectionTypeInfo::Rep absolute = record(ccDigital, ctAES_EBU, true, true, 44100.0, 48000.0);
  const IO_ConnectionTypeInfo::Rep relative = record(ccDigital, ctSPDIF, true, false, 0.1, 0.1);
  const IO_ConnectionTypeInfo::Rep noSrc = record(ccDigital, ctSDI, false, true, 0.0, 1e9);
  const IO_ConnectionTypeInfo::Rep analogue = record(ccAnalogue, ctAnalogue, false);
  const IO_ConnectionTypeInfo::Rep mixer = record(ccMixer, ctNone, false);
  const IO_ConnectionTypeInfo::Rep nanBounds = record(ccDigital, ctAES_EBU, true, false, NAN, 0.1);
  const struct {
    const IO_ConnectionTypeInfo::Rep& rep;
    SampleRate reference, rate;
    bool supported;
  } rows[] = {
      {absolute, k32, k48, true},
      {absolute, k96, k44, true},  // absolute bounds ignore the reference
      {absolute, k48, k96, false},
      {absolute, k48, k32, false},
      {absolute, k48, SampleRate(sr48000, fx1001), false},  // 48048 Hz
      {absolute, k48, SampleRate(sr48000, fx1_1001), true},
      {relative, k48, k44, true},  // 43200 to 52800 Hz
      {relative, k48, k48, true},
      {relative, k48, k32, false},
      {relative, k48, k96, false},
      {relative, k48, SampleRate(sr48000, fx25_24), true},   // 50000 Hz
      {relative, k48, SampleRate(sr44100, fx24_25), false},  // 42336 Hz
      {relative, SampleRate(sr24000, fNone), SampleRate(sr24000, fx25_24), true},
      {noSrc, k48, k48, false},
      {analogue, k48, k96, true},
      {analogue, k48, SampleRate(), true},
      {mixer, k48, SampleRate(), true},
      {absolute, k48, SampleRate(), false},
      {nanBounds, k48, k48, false}  // 0 Hz
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(testing::Message() << row.reference.calcCombinedSampleRate() << " -> "
                                    << row.rate.calcCombinedSampleRate());
    EXPECT_EQ(IO_CapsFactory::makeConnectionTypeInfo(row.rep).supportsSRC(row.reference, row.rate),
              row.supported);
  }
  // The bounds are inclusive.
  const IO_ConnectionTypeInfo::Rep exact = record(ccDigital, ctHDMI, true, false, 0.5, 1.0);
  EXPECT_TRUE(IO_CapsFactory::makeConnectionTypeInfo(exact).supportsSRC(k48, SampleRate(sr48000, fx1_2)));
  EXPECT_TRUE(IO_CapsFactory::makeConnectionTypeInfo(exact).supportsSRC(k48, SampleRate(sr48000, fx2)));
  EXPECT_FALSE(
      IO_CapsFactory::makeConnectionTypeInfo(exact).supportsSRC(k48, SampleRate(sr48000, fx2 | fx1001)));
}

TEST(IO_SyncSourceTypeInfo, RecordAndInvalidInfo) {
  const IO_SyncSourceTypeInfo::Rep rep{3, ssLTC};
  const IO_SyncSourceTypeInfo info = IO_CapsFactory::makeSyncSourceTypeInfo(rep);
  EXPECT_EQ(info.numInputs(), 3u);
  EXPECT_EQ(info.type(), ssLTC);
  FatalReports reports;
  const IO_SyncSourceTypeInfo invalid;
  EXPECT_EQ(invalid.type(), ssNone);
  EXPECT_TRUE(reports.take().empty());
  EXPECT_EQ(invalid.numInputs(), 0u);
  EXPECT_EQ(reports.take(),
            std::vector<std::string>{"Method called on invalid IO_SyncSourceTypeInfo object"});
}

TEST(IO_DisplayStrings, ConnectionTypes) {
  const struct {
    int type;
    const wchar_t* text;
  } rows[] = {{2, L"Analogue"}, {3, L"AES/EBU"}, {4, L"1394"},     {5, L"ADAT"},
              {6, L"S/PDIF"},   {7, L"SDI"},     {9, L"HDMI"},     {8, L"Invalid"},
              {0, L"Invalid"},  {1, L"Invalid"}, {10, L"Invalid"}, {-2, L"Invalid"}};
  FatalReports reports;
  for (const auto& row : rows)
    EXPECT_EQ(getDisplayString(eIO_ConnectionType(row.type)), row.text) << row.type;
  EXPECT_TRUE(reports.take().empty());
  host::setResourceText(2081, L"SDI (embedded)");
  EXPECT_EQ(getDisplayString(ctSDI), L"SDI (embedded)");
  host::setResourceText(2081, L"SDI");
}

TEST(IO_DisplayStrings, SyncSourceTypesAndDodgyValues) {
  FatalReports reports;
  EXPECT_EQ(getDisplayString(ssFreeRunning), L"Free Running");
  EXPECT_EQ(getDisplayString(ssVideo), L"Video");
  EXPECT_EQ(getDisplayString(ssLTC), L"LTC");
  EXPECT_EQ(getDisplayString(ssAES_EBU), L"AES/EBU");
  EXPECT_TRUE(reports.take().empty());
  for (int bad : {0, 5, -1, 1000}) {
    EXPECT_EQ(getDisplayString(eIO_SyncSourceType(bad)), L"") << bad;
    EXPECT_EQ(reports.take(), std::vector<std::string>{"Dodgy enum!"}) << bad;
  }
}

TEST(IO_SyncSource, DisplayTexts) {
  const struct {
    eIO_SyncSourceType type;
    unsigned input;
    const wchar_t* text;
  } rows[] = {{ssAES_EBU, 0, L"AES/EBU 1&2"},         {ssAES_EBU, 1, L"AES/EBU 3&4"},
              {ssAES_EBU, 7, L"AES/EBU 3&4"},         {ssVideo, 0, L"Video 1"},
              {ssFreeRunning, 2, L"Free Running 3"},  {ssLTC, 0xFFFFFFFF, L"LTC 0"},
              {ssLTC, 0x7FFFFFFF, L"LTC 2147483648"}, {ssVideo, 0xFFFFFFFE, L"Video 4294967295"}};
  for (const auto& row : rows) EXPECT_EQ(IO_SyncSource(row.type, row.input).getDisplayString(), row.text);
  FatalReports reports;
  EXPECT_EQ(IO_SyncSource().getDisplayString(), L" 0");
  EXPECT_EQ(reports.take(), std::vector<std::string>{"Dodgy enum!"});
}

TEST(IO_SyncSource, ValueSemantics) {
  IO_SyncSource source(ssVideo, 3);
  IO_SyncSource copy(source);
  EXPECT_EQ(copy, source);
  EXPECT_EQ(copy.inputNumber(7), sSuccess);
  EXPECT_EQ(copy.type(eIO_SyncSourceType(99)), sSuccess);  // any value is taken
  EXPECT_EQ(source.inputNumber(), 3u);                     // copies have their own record
  EXPECT_FALSE(copy == source);
  source = copy;
  copy.reset();
  EXPECT_EQ(source.type(), eIO_SyncSourceType(99));
  EXPECT_EQ(source.inputNumber(), 7u);
  EXPECT_EQ(copy, IO_SyncSource());
  EXPECT_EQ(copy.type(), ssNone);
  EXPECT_EQ(copy.inputNumber(), 0xFFFFFFFFu);
  EXPECT_TRUE(copy.valid());
}

TEST(AudCapsVector, LooksUpByType) {
  const IO_ConnectionTypeInfo::Rep a = record(ccDigital, ct1394), b = record(ccAnalogue, ctAnalogue),
                                   c = record(ccDigital, ct1394);
  AudCapsVector<IO_ConnectionTypeInfo, eIO_ConnectionType> caps;
  EXPECT_EQ(caps.find(ct1394), 0u);
  EXPECT_EQ(caps[ct1394].type(), ctNone);
  caps.push_back(IO_CapsFactory::makeConnectionTypeInfo(b));
  caps.push_back(IO_CapsFactory::makeConnectionTypeInfo(a));
  caps.push_back(IO_CapsFactory::makeConnectionTypeInfo(c));
  EXPECT_EQ(caps.find(ct1394), 1u);
  EXPECT_EQ(caps.find(ctAnalogue), 0u);
  EXPECT_EQ(caps.find(ctHDMI), caps.size());
  EXPECT_EQ(caps[ctHDMI].type(), ctNone);  // an invalid info
  EXPECT_TRUE(caps[ct1394].isDigital());
  EXPECT_TRUE(caps.at(0).isAnalogue());

  const AudCapsVector<IO_ConnectionTypeInfo, eIO_ConnectionType> copy(caps);
  EXPECT_EQ(copy.size(), 3u);
  AudCapsVector<IO_ConnectionTypeInfo, eIO_ConnectionType> assigned;
  assigned = copy;
  EXPECT_EQ(assigned.find(ct1394), 1u);
  const std::vector<IO_ConnectionTypeInfo, StdAllocator<IO_ConnectionTypeInfo>> plain(2, caps[ct1394]);
  const AudCapsVector<IO_ConnectionTypeInfo, eIO_ConnectionType> fromVector(plain);
  EXPECT_EQ(fromVector.find(ct1394), 0u);

  const IO_SyncSourceTypeInfo::Rep video{1, ssVideo}, aes{2, ssAES_EBU};
  AudCapsVector<IO_SyncSourceTypeInfo, eIO_SyncSourceType> sync;
  sync.push_back(IO_CapsFactory::makeSyncSourceTypeInfo(video));
  sync.push_back(IO_CapsFactory::makeSyncSourceTypeInfo(aes));
  EXPECT_EQ(sync.find(ssAES_EBU), 1u);
  EXPECT_EQ(sync[ssAES_EBU].numInputs(), 2u);
  EXPECT_EQ(sync.find(ssLTC), 2u);
  EXPECT_EQ(sync[ssLTC].type(), ssNone);
}

}  // namespace
