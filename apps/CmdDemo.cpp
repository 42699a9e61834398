// tonebits demo: the library's main job end to end, on a programme it
// synthesises. A six-channel 24-bit "capture" is deinterleaved block by
// block, metered at the inputs, converted to float, equalised, put through
// level automation that is edited while it plays, mixed to stereo through a
// mixer state, metered at the outputs and exported as demo.wav, with a
// picture of the result in demo.svg.
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <random>

#include "AudioIO.h"
#include "Cli.h"
#include "Commands.h"
#include "MixEngine.h"
#include "Svg.h"
#include "host/IniFile.h"
#include "tonebits/dsp/Aud__MixRender.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"
#include "tonebits/metering/Aud__Monitor.h"
#include "tonebits/metering/Aud__MonitoringPoint.h"
#include "tonebits/metering/Aud__MonitoringPointManager.h"

namespace cli {

namespace {

const char* kHelp =
    "usage: tonebits demo [--dir DIR] [--seconds S] [--quiet]\n"
    "\n"
    "Synthesises a six-channel programme (dialogue, music pair, effects, low\n"
    "end, sweep), runs it through the whole chain and writes DIR/demo.wav\n"
    "(stereo, 24 bit), DIR/demo.svg (what happened) and DIR/demo-mix.ini (the\n"
    "mixer state). Prints the meter readings and the speed.\n";

constexpr unsigned kInputs = 6;
constexpr uint32_t kRate = 48000;
constexpr unsigned kBlock = 1024;
const char* kNames[kInputs] = {"dialogue", "music L", "music R", "effects", "low end", "sweep"};

// The programme: what a six-input device would capture.
void synthesise(PlanarBlock& block, uint64_t first, std::size_t n, std::mt19937& noise) {
  const double twoPi = 6.283185307179586;
  std::normal_distribution<float> gauss(0.0f, 0.15f);
  for (std::size_t k = 0; k < n; ++k) {
    const double t = double(first + k) / kRate;
    const double syllables = std::pow(std::max(0.0, std::sin(twoPi * 3.7 * t)), 2.0);
    double voice = 0;
    for (int h = 1; h <= 8; ++h)
      voice += std::sin(twoPi * 180.0 * h * t) * (h == 3 || h == 4 ? 0.5 : 0.25) / h;
    block.channel(0)[k] = float(0.8 * syllables * voice);
    const double tremolo = 0.8 + 0.2 * std::sin(twoPi * 0.5 * t);
    block.channel(1)[k] =
        float(0.2 * tremolo *
              (std::sin(twoPi * 220.0 * t) + std::sin(twoPi * 277.18 * t) + std::sin(twoPi * 329.63 * t)));
    block.channel(2)[k] =
        float(0.2 * tremolo *
              (std::sin(twoPi * 220.7 * t) + std::sin(twoPi * 277.9 * t) + std::sin(twoPi * 330.4 * t)));
    const bool burst = std::fmod(t, 2.0) > 1.2 && std::fmod(t, 2.0) < 1.5;
    block.channel(3)[k] = burst ? gauss(noise) : 0.0f;
    block.channel(4)[k] = float(0.25 * std::sin(twoPi * 55.0 * t));
    const double sweepPhase = 50.0 * 8.0 / std::log(240.0) * (std::pow(240.0, t / 8.0) - 1.0);
    block.channel(5)[k] = float(0.12 * std::sin(twoPi * sweepPhase));
  }
}

// The capture device's side of the input meters.
class DemoDevice : public Aud::Monitor {
 public:
  DemoDevice() { registerMonitoringPoints(kInputs); }
  virtual ~DemoDevice() {
    for (const IdStamp& writer : inputWriterIds) Aud::MonitoringPointManager::unregisterMP(writer);
  }
  void captured(Aud::StreamBufferList& block) { updateMonitoringPoints(block); }
};

// A fade in, a dip and a fade out, over a programme of the given length.
Aud::DynamicLevelControl::Store makeAutomation(double seconds) {
  using Node = Aud::DynamicLevelControl::Store::Node;
  Aud::DynamicLevelControl::Store store;
  const std::pair<double, float> nodes[] = {{0.0, 0.0f}, {0.4, 1.0f}, {2.8, 1.0f}, {3.2, 0.5f},
                                            {5.2, 0.5f}, {5.6, 1.0f}, {7.2, 1.0f}, {8.0, 0.0f}};
  for (const auto& [t, level] : nodes) store.insert(Node(t * seconds / 8.0, level));
  return store;
}

}  // namespace

int runDemo(int argc, char** argv, int first) {
  Args args(argc, argv, first, {"dir", "seconds"}, {"help", "quiet"});
  if (args.has("help")) {
    std::fputs(kHelp, stdout);
    return kOk;
  }
  if (!args.positional().empty()) throw UsageError("demo takes no file arguments");
  const std::string dir = args.value("dir", ".");
  const double seconds = parseNumber(args.value("seconds", "8"), "seconds", 1, 600);
  const uint64_t frames = static_cast<uint64_t>(seconds * kRate);
  const double editTime = seconds * 0.525;

  // The capture: synthesised, then packed as the device delivers it.
  PlanarBlock synth(kInputs, kBlock);
  AudioInterleaver device(2, kInputs, Aud::eDataType(201));
  std::mt19937 noise(2026);

  // The chain.
  DemoDevice inputs;
  std::vector<Aud::MonitoringPointReader> inputMeters;
  for (unsigned c = 0; c < kInputs; ++c) inputMeters.emplace_back(inputs.getInputMonitoringPointId(c));
  AudioInterleaver inbound;
  inbound.setAudioFormat(device.getAudioFormat());
  Aud::StreamBufferList captured;
  PlanarBlock planar(kInputs, kBlock);
  std::vector<float*> planes = planar.pointers();

  std::vector<Aud::Filter::MultiBandBiquad<3>> eq(kInputs);
  std::vector<Aud::Filter::MultiBandBiquad<3>*> eqPointers;
  for (auto& chain : eq) {
    Aud::Filter::Biquad::ShapeDescriptor slope(Aud::Filter::Biquad::ShapeDescriptor::S, 1.0f);
    Aud::Filter::Biquad::ShapeDescriptor q(Aud::Filter::Biquad::ShapeDescriptor::Q, 1.2f);
    chain.getBand(0).configure(Aud::Filter::Biquad::LowShelf, 120.0f, float(kRate), slope, 3.0);
    chain.getBand(1).configure(Aud::Filter::Biquad::PeakingEQ, 2500.0f, float(kRate), q, -4.0);
    chain.getBand(2).configure(Aud::Filter::Biquad::HighShelf, 9000.0f, float(kRate), slope, 2.0);
    for (unsigned b = 0; b < 3; ++b) chain.getBand(b).setActive(true);
    eqPointers.push_back(&chain);
  }

  Aud::DynamicLevelControl::Store automation = makeAutomation(seconds);
  std::vector<Aud::DynamicLevelControl::DynamicLevelApplyingIterator> levels(kInputs);
  for (auto& it : levels) it.configureForwards(&automation, kRate, 0.0);

  Aud::SimpleMixState state(kInputs, 0, 2);
  state.resetToDefaultConfiguration(false);
  const float faders[kInputs] = {1.0f, 0.92f, 0.92f, 0.85f, 0.8f, 0.75f};
  const float pans[kInputs] = {0.5f, 0.15f, 0.85f, 0.35f, 0.5f, 0.7f};
  for (unsigned i = 0; i < kInputs; ++i) {
    state.setInputLevel(int(i), faders[i]);
    state.setInputPan(int(i), pans[i]);
  }
  KvIniFile mixFile;
  state.storeCompatibleConfigurationInformation(mixFile);
  MixEngine mixer(state, kInputs, 1, 2);
  PlanarBlock stereo(2, kBlock);
  std::vector<float*> stereoPlanes = stereo.pointers();
  float outputPeak[2] = {0, 0};
  std::vector<float> inputPeak(kInputs, 0.0f);

  const std::string wavPath = dir + "/demo.wav";
  PlanarWriter writer(wavPath, 2, kRate, 2);
  Progress progress("demo", frames, args.has("quiet"));

  // For the picture: the output peak and the automation gain every 20 ms.
  const std::size_t pictureStep = kRate / 50;
  Series left{"output L peak (dBFS)", "#1f77b4", {}}, right{"output R peak (dBFS)", "#d62728", {}};
  Series gainSeries{"automation gain (dB)", "#2ca02c", {}};
  float stepPeak[2] = {0, 0};

  double chainSeconds = 0;
  bool edited = false;
  for (uint64_t done = 0; done < frames;) {
    const std::size_t n = static_cast<std::size_t>(std::min<uint64_t>(kBlock, frames - done));
    const unsigned quads = static_cast<unsigned>((n + 3) / 4);
    synthesise(synth, done, n, noise);
    std::vector<const unsigned char*> typed;
    std::vector<std::vector<unsigned char>> typedPlanes(kInputs, std::vector<unsigned char>(n * 3));
    for (unsigned c = 0; c < kInputs; ++c) {
      Aud::convertFromFloat(2, synth.channel(c), typedPlanes[c].data(), n);
      typed.push_back(typedPlanes[c].data());
    }
    device.writeSamplesPlanar(typed, static_cast<unsigned>(n));
    Kv::Ptr<iMemHolder> bytes(new ByteBufferImpl(n * kInputs * 3));
    std::copy(device.getOutputBuffer(), device.getOutputBuffer() + n * kInputs * 3, bytes->getBuffer());

    // The edit a user makes while it plays: the dip goes deeper.
    if (!edited && double(done) / kRate >= editTime) {
      auto node = automation.find(3.2 * seconds / 8.0);
      for (int k = 0; k < 2 && node != automation.end(); ++k, ++node) node.setLevel(0.2f);
      edited = true;
    }

    const double start = nowSeconds();
    inbound.deinterleaveAudio(bytes, captured);
    inputs.captured(captured);
    for (unsigned c = 0; c < kInputs; ++c) {
      Aud::convertToFloat(captured.sampleType, captured.buffers[c].getBuffer(), planes[c], n);
      std::fill(planes[c] + n, planes[c] + quads * 4, 0.0f);
    }
    Aud::Filter::MultiBandBiquad<3>::processBlockMultiChannel(eqPointers.data(), planes.data(), planes.data(),
                                                              kInputs, static_cast<unsigned>(n));
    for (unsigned c = 0; c < kInputs; ++c) levels[c].apply(planes[c], n);
    mixer.process(planes.data(), stereoPlanes.data(), quads);
    for (unsigned c = 0; c < 2; ++c) Aud::MixRender::PeakScan(stereoPlanes[c], quads, &outputPeak[c]);
    writer.write(stereo, n);
    chainSeconds += nowSeconds() - start;

    for (unsigned c = 0; c < kInputs; ++c)
      inputPeak[c] = std::max(inputPeak[c], inputMeters[c].peakValue(true));
    for (std::size_t k = 0; k < n; ++k) {
      for (unsigned c = 0; c < 2; ++c) stepPeak[c] = std::max(stepPeak[c], std::fabs(stereoPlanes[c][k]));
      if ((done + k + 1) % pictureStep == 0) {
        const double t = double(done + k) / kRate;
        auto db = [](float v) { return v > 0 ? std::max(-60.0, 20.0 * std::log10(v)) : -60.0; };
        left.points.emplace_back(t, db(stepPeak[0]));
        right.points.emplace_back(t, db(stepPeak[1]));
        gainSeries.points.emplace_back(t, db(automation.getLevelAtTime(t)));
        stepPeak[0] = stepPeak[1] = 0;
      }
    }
    done += n;
    progress.update(done);
  }
  const double start = nowSeconds();
  writer.commit();
  chainSeconds += nowSeconds() - start;
  progress.finish();
  if (!mixFile.save((dir + "/demo-mix.ini").c_str()))
    throw WaveError(WaveError::Io, "'" + dir + "/demo-mix.ini': cannot write");

  Chart chart;
  chart.title = "tonebits demo: output peaks and level automation (edited at " +
                std::to_string(editTime).substr(0, 4) + " s)";
  chart.xLabel = "time (s)";
  chart.yLabel = "dB";
  chart.xMin = 0;
  chart.xMax = seconds;
  chart.yMin = -60;
  chart.yMax = 6;
  for (double x = 0; x <= seconds + 1e-9; x += seconds > 20 ? 5 : 1) chart.xTicks.push_back(x);
  for (double y = -60; y <= 0; y += 12) chart.yTicks.push_back(y);
  chart.series = {left, right, gainSeries};
  writeTextFile(dir + "/demo.svg", renderSvg(chart));

  std::printf("tonebits demo: %.1f s of six-channel 24-bit audio at 48 kHz\n", seconds);
  std::printf(
      "  chain: deinterleave, input meters, convert, 3-band equaliser, level automation\n"
      "         (edited at %.2f s while playing), mix to stereo, output meters, export\n",
      editTime);
  std::printf("  input meters (through monitoring points):\n");
  for (unsigned c = 0; c < kInputs; ++c)
    std::printf("    %-9s %8s dBFS\n", kNames[c], formatDb(inputPeak[c]).c_str());
  std::printf("  output peaks: L %s dBFS, R %s dBFS\n", formatDb(outputPeak[0]).c_str(),
              formatDb(outputPeak[1]).c_str());
  std::printf("  wrote %s, %s/demo.svg, %s/demo-mix.ini\n", wavPath.c_str(), dir.c_str(), dir.c_str());
  std::printf("  ran %.0f times faster than real time (%.1f ms for the chain)\n",
              seconds / std::max(chainSeconds, 1e-9), chainSeconds * 1000);
  return kOk;
}

}  // namespace cli
