#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstring>
#include <limits>
#include <optional>
#include <set>
#include <string>

#include "metering/MeteringTestSupport.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"
#include "tonebits/metering/Aud__SamplePeak.h"

namespace {

using Aud::MonitoringPointManager;
using Aud::MonitoringPointReader;
using Aud::StreamBuffer;
using Aud::StreamBufferList;
using metering_test::bufferOf;
using metering_test::bytesOf;
using metering_test::Capture;
using metering_test::ManualClock;
using metering_test::TestMonitor;
using Bytes = std::vector<unsigned char>;

constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
constexpr float kInf = std::numeric_limits<float>::infinity();

StreamBufferList listOf(std::vector<StreamBuffer> buffers, unsigned numSamples, int type) {
  StreamBufferList list;
  for (auto& b : buffers) list.buffers.push_back(b);
  list.numSamples = numSamples;
  list.sampleType = type;
  return list;
}

class MonitorTest : public ::testing::Test {
 protected:
  // Readers on every input, each left with a taken peak of `held`, so that
  // the next write replaces it and no write leaves it.
  std::vector<MonitoringPointReader> readersPrimedWith(TestMonitor& monitor, float held) {
    std::vector<MonitoringPointReader> readers;
    readers.reserve(monitor.inputs());  // a copied reader starts afresh
    for (unsigned i = 0; i < monitor.inputs(); ++i) {
      readers.emplace_back(monitor.getInputMonitoringPointId(i));
      MonitoringPointManager::instance().mpUpdatePeakSampleValue(monitor.writerId(i), held);
      readers.back().peakValue(true);
      readers.back().hasClipped(true);
    }
    return readers;
  }

  ManualClock clock;  // frozen: nothing expires
};

TEST_F(MonitorTest, RegistersOnePointPerInputNamedFromZeroOnEveryCall) {
  TestMonitor monitor;
  monitor.registerMonitoringPoints(0);
  EXPECT_EQ(monitor.inputs(), 0u);
  EXPECT_FALSE(monitor.getInputMonitoringPointId(0).valid());

  monitor.registerMonitoringPoints(2);
  monitor.registerMonitoringPoints(2);
  ASSERT_EQ(monitor.inputs(), 4u);
  const char* names[] = {"[ZIREzuru][PhysicalInput][0]", "[ZIREzuru][PhysicalInput][1]",
                         "[ZIREzuru][PhysicalInput][0]", "[ZIREzuru][PhysicalInput][1]"};
  std::set<IdStamp> ids;
  for (unsigned i = 0; i < 4; ++i) {
    SCOPED_TRACE(i);
    const auto& info = MonitoringPointManager::getInfo(monitor.writerId(i));
    EXPECT_EQ(info.code, 0);
    EXPECT_STREQ(info.text1, names[i]);
    EXPECT_STREQ(info.text2, names[i]);
    EXPECT_STREQ(info.text3, names[i]);
    EXPECT_TRUE(info.flag);
    EXPECT_EQ(info.value, 60.0f);
    EXPECT_TRUE(MonitoringPointReader(monitor.getInputMonitoringPointId(i)).valid());
    ids.insert(monitor.getInputMonitoringPointId(i));
    ids.insert(monitor.writerId(i));
  }
  EXPECT_EQ(ids.size(), 8u);
  EXPECT_FALSE(monitor.getInputMonitoringPointId(4).valid());
  EXPECT_FALSE(monitor.getInputMonitoringPointId(UINT_MAX).valid());
}

TEST_F(MonitorTest, PointsOutliveTheMonitorAndCopiesNameTheSamePoints) {
  IdStamp pointId, writerId;
  std::optional<MonitoringPointReader> reader;
  {
    TestMonitor monitor;
    monitor.registerMonitoringPoints(1);
    TestMonitor copy(monitor);
    TestMonitor assigned;
    assigned = monitor;
    EXPECT_EQ(copy.getInputMonitoringPointId(0), monitor.getInputMonitoringPointId(0));
    EXPECT_EQ(assigned.writerId(0), monitor.writerId(0));
    pointId = monitor.getInputMonitoringPointId(0);
    writerId = monitor.writerId(0);
    reader.emplace(pointId);
  }
  EXPECT_TRUE(reader->valid());
  EXPECT_STREQ(MonitoringPointManager::getInfo(writerId).text1, "[ZIREzuru][PhysicalInput][0]");
  EXPECT_EQ(MonitoringPointManager::unregisterMP(writerId), Aud::sSuccess);
}

// Every sample type's decoding, at its extremes: the kernel's peak, and what
// a meter of the input then reads (a clip first raises it to full scale).
TEST_F(MonitorTest, PeakAndClipOfEverySampleType) {
  struct Row {
    const char* what;
    int type;
    Bytes bytes;
    float peak;
    bool clip;
  };
  const float int32Zero = float(0.5 / 2147483647.5);
  const Row rows[] = {
      {"float", 0, bytesOf<float>({0.25f, -0.5f, 0.125f}), 0.5f, false},
      {"float nearest 0.99 clips", 0, bytesOf<float>({0.99f}), 0.99f, true},
      {"float just below 0.99", 0, bytesOf<float>({std::nextafter(0.99f, 0.0f)}), std::nextafter(0.99f, 0.0f),
       false},
      {"float 0.98999", 0, bytesOf<float>({-0.98999f}), 0.98999f, false},
      {"float NaN passed over", 0, bytesOf<float>({kNaN, 0.25f, -kNaN}), 0.25f, false},
      {"float only NaN", 0, bytesOf<float>({kNaN, kNaN}), 0.0f, false},
      {"float negative zero", 0, bytesOf<float>({-0.0f}), 0.0f, false},
      {"float infinity", 0, bytesOf<float>({0.5f, -kInf}), kInf, true},
      {"float above full scale", 0, bytesOf<float>({1.5f}), 1.5f, true},
      {"int16 most negative", 1, bytesOf<int16_t>({-32768}), 1.0f, true},
      {"int16 most positive", 1, bytesOf<int16_t>({32767}), 0.999969482421875f, true},
      {"int16 below the threshold", 1, bytesOf<int16_t>({-32440, 100}), 32440.0f / 32768, false},
      {"int16 above the threshold", 1, bytesOf<int16_t>({100, 32441}), 32441.0f / 32768, true},
      {"int16 silence", 1, bytesOf<int16_t>({0, 0}), 0.0f, false},
      {"int24 most negative", 2, {0x00, 0x00, 0x80, 0x01, 0x00, 0x00}, 1.0f, true},
      {"int24 most positive", 2, {0xFF, 0xFF, 0x7F}, 0.99999988079071044921875f, true},
      {"int24 minus one", 2, {0xFF, 0xFF, 0xFF}, 0x1p-23f, false},
      {"int8 most negative", 3, {0x80}, 1.0f, true},
      {"int8 most positive", 3, {0x7F, 0x00}, 0.9921875f, true},
      {"int8 below the threshold", 3, {0x82, 0x7E}, 0.984375f, false},
      {"uint8 zero is full scale", 4, {0x00}, 1.0f, true},
      {"uint8 offset is silence", 4, {0x80, 0x80}, 0.0f, false},
      {"uint8 top", 4, {0xFF}, 0.9921875f, true},
      {"uint8 near the offset", 4, {0x81, 0x7E}, 0.015625f, false},
      {"int24 in 32 ignores byte 3", 5, {0x01, 0x00, 0x00, 0xFF, 0xFF, 0xFF, 0xFF, 0x00}, 0x1p-23f, false},
      {"int24 in 32 most negative", 5, {0x00, 0x00, 0x80, 0x12}, 1.0f, true},
      {"int24 in 32 most positive", 5, {0xFF, 0xFF, 0x7F, 0x80}, 0.99999988079071044921875f, true},
      {"int32 zeros are not silence", 6, bytesOf<int32_t>({0, 0, 0}), int32Zero, false},
      {"int32 minus one", 6, bytesOf<int32_t>({-1}), int32Zero, false},
      {"int32 most negative", 6, bytesOf<int32_t>({INT32_MIN}), 1.0f, true},
      {"int32 most positive", 6, bytesOf<int32_t>({INT32_MAX, 0}), 1.0f, true},
      {"unclamped float", 7, bytesOf<float>({1.5f, -2.0f}), 2.0f, true},
      {"double rounded to float", 8, bytesOf<double>({0.5, -0.75}), 0.75f, false},
      {"double 0.99", 8, bytesOf<double>({0.99}), 0.99f, true},
      {"double NaN", 8, bytesOf<double>({std::nan(""), 0.125}), 0.125f, false},
      {"double beyond float range", 8, bytesOf<double>({-1e300}), kInf, true},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    const unsigned n = unsigned(row.bytes.size() / Aud::bytesPerSampleOfType(row.type));
    const float kernel = Aud::Private::samplePeak(row.type, row.bytes.data(), n);
    EXPECT_EQ(kernel, row.peak);
    EXPECT_FALSE(std::signbit(kernel));

    TestMonitor monitor;
    monitor.registerMonitoringPoints(1);
    auto readers = readersPrimedWith(monitor, 0.5f);
    StreamBufferList block = listOf({bufferOf(row.bytes, n, row.type)}, n, row.type);
    monitor.updateMonitoringPoints(block);
    EXPECT_EQ(readers[0].hasClipped(true), row.clip);
    EXPECT_EQ(readers[0].peakValue(true), row.clip ? std::max(1.0f, row.peak) : row.peak);
  }
}

TEST_F(MonitorTest, UnsupportedSampleTypesLogPerBufferAndWriteZero) {
  for (int type : {-1, 9, 100, INT_MIN, INT_MAX}) {
    SCOPED_TRACE(type);
    TestMonitor monitor;
    monitor.registerMonitoringPoints(2);
    auto readers = readersPrimedWith(monitor, 0.5f);
    StreamBufferList block = listOf({bufferOf({0xFF, 0xFF, 0xFF, 0xFF}, 1, type), StreamBuffer()}, 1, type);
    Capture capture;
    monitor.updateMonitoringPoints(block);
    const auto lines = capture.log();
    ASSERT_EQ(lines.size(), 2u);
    for (const auto& line : lines) EXPECT_EQ(line, "Monitor: buffer sample format not supported!\n");
    for (auto& r : readers) {
      EXPECT_EQ(r.peakValue(true), 0.0f);
      EXPECT_FALSE(r.hasClipped(true));
    }
  }
}

TEST_F(MonitorTest, BuffersAreMatchedToInputsInOrder) {
  TestMonitor monitor;
  monitor.registerMonitoringPoints(3);
  struct Row {
    const char* what;
    std::vector<float> channelPeaks;  // one buffer per entry
    float expect[3];                  // 0.5 where the input got no write
  };
  const Row rows[] = {
      {"one buffer per input", {0.1f, 0.2f, 0.3f}, {0.1f, 0.2f, 0.3f}},
      {"fewer buffers leave inputs unwritten", {0.1f}, {0.1f, 0.5f, 0.5f}},
      {"extra buffers are not read", {0.1f, 0.2f, 0.3f, 0.95f, 0.99f}, {0.1f, 0.2f, 0.3f}},
      {"an empty block writes nothing", {}, {0.5f, 0.5f, 0.5f}},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    auto readers = readersPrimedWith(monitor, 0.5f);
    std::vector<StreamBuffer> buffers;
    for (float peak : row.channelPeaks) buffers.push_back(bufferOf(bytesOf<float>({peak / 2, -peak}), 2, 0));
    StreamBufferList block = listOf(buffers, 2, 0);
    monitor.updateMonitoringPoints(block);
    for (unsigned i = 0; i < 3; ++i) EXPECT_EQ(readers[i].peakValue(true), row.expect[i]) << "input " << i;
  }
}

// A block's memory may not hold what its sample count claims: a block
// without memory writes a peak of 0, and only whole samples inside the
// memory are read (under ASan a read past the end stops the test).
TEST_F(MonitorTest, ReadsOnlyTheSamplesABlockHolds) {
  TestMonitor monitor;
  monitor.registerMonitoringPoints(4);
  auto readers = readersPrimedWith(monitor, 0.5f);

  Bytes held = bytesOf<int16_t>({100, -300, 200});
  held.push_back(0x80);  // half a sample: not read
  StreamBufferList block = listOf({StreamBuffer(0, 1u << 20, 1), bufferOf(held, 1u << 20, 1),
                                   bufferOf({}, 1u << 20, 1), bufferOf(bytesOf<int16_t>({-32768, 5}), 1, 1)},
                                  1u << 20, 1);
  monitor.updateMonitoringPoints(block);
  EXPECT_EQ(readers[0].peakValue(true), 0.0f);
  EXPECT_EQ(readers[1].peakValue(true), 300.0f / 32768);
  EXPECT_EQ(readers[2].peakValue(true), 0.0f);
  EXPECT_EQ(readers[3].peakValue(true), 1.0f);  // more memory than the count: the count wins
  block.numSamples = 0;
  block.buffers[3] = bufferOf(bytesOf<int16_t>({-32768}), 1, 1);
  monitor.updateMonitoringPoints(block);
  for (auto& r : readers) EXPECT_EQ(r.peakValue(true), 0.0f);
}

}  // namespace
