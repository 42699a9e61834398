// tonebits process IN OUT: gain, equaliser and level automation, forwards or
// reversed, streamed in blocks.
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <memory>

#include "AudioIO.h"
#include "Automation.h"
#include "Cli.h"
#include "Commands.h"
#include "Equaliser.h"
#include "FaderLaw.h"
#include "tonebits/dsp/Aud__MixRender.h"
#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"

namespace cli {

namespace {

const char* kHelp =
    "usage: tonebits process IN OUT [options]\n"
    "\n"
    "  --gain DB             gain in decibels\n"
    "  --fader U             gain as a fader position on --law (1.0 is unity)\n"
    "  --law LAW             fader law: mixer (default), linear or power\n"
    "  --eq TYPE:FREQ[:WIDTH][:GAIN]\n"
    "                        an equaliser band, up to five, applied in order:\n"
    "                        TYPE lowpass highpass bandpass bandpass-peak notch\n"
    "                        allpass peak lowshelf highshelf; WIDTH 0.7q (Q),\n"
    "                        1o (octaves) or 1s (shelf slope); GAIN in dB\n"
    "  --automation FILE     level automation: lines of TIME LEVEL (seconds,\n"
    "                        linear gain or dB with a dB suffix)\n"
    "  --reverse             play the file backwards through the chain; OUT\n"
    "                        holds the reversed result\n"
    "  --type TYPE           output sample type: \"16 bit\", \"24 bit\" or\n"
    "                        \"24 bit unpacked (4 bytes)\" (default: the input's\n"
    "                        when it is one of these, else \"24 bit\")\n"
    "  --allow-truncated     process what a truncated file holds\n"
    "  --quiet               no progress bar\n"
    "\n"
    "Example: tonebits process in.wav out.wav --eq peak:1000:1q:-6 --gain -3\n";

constexpr std::size_t kBlock = 1 << 14;

}  // namespace

int defaultOutputType(const Aud::Metadata& m) {
  const int type = m.getSampleTypeNumber();
  return type == 1 || type == 2 ? type : 2;
}

int runProcess(int argc, char** argv, int first) {
  Args args(argc, argv, first, {"gain", "fader", "law", "eq", "automation", "type"},
            {"help", "reverse", "allow-truncated", "quiet"});
  if (args.has("help")) {
    std::fputs(kHelp, stdout);
    return kOk;
  }
  if (args.positional().size() != 2) throw UsageError("process takes IN and OUT");
  const std::string in = args.positional()[0], out = args.positional()[1];
  checkOutput(in, out);
  if (args.has("gain") && args.has("fader")) throw UsageError("give --gain or --fader, not both");

  float gain = 1.0f;
  if (args.has("gain"))
    gain = static_cast<float>(std::pow(10.0, parseNumber(args.value("gain"), "gain", -120, 40) / 20.0));
  if (args.has("fader"))
    gain =
        faderToGain(parseLaw(args.value("law", "mixer")), parseNumber(args.value("fader"), "fader position"));
  if (args.has("law") && !args.has("fader")) throw UsageError("--law goes with --fader");
  std::vector<BandSpec> bands;
  for (const std::string& band : args.values("eq")) bands.push_back(parseBand(band));
  std::unique_ptr<Aud::DynamicLevelControl::Store> automation;
  if (args.has("automation")) automation = readAutomation(args.value("automation"));
  const bool reverse = args.has("reverse");

  PlanarReader reader(in, args.has("allow-truncated"));
  const int type =
      args.has("type") ? exportTypeFromName(args.value("type")) : defaultOutputType(reader.metadata());
  const unsigned channels = reader.channels();
  const double rate = reader.sampleRate();
  Equaliser eq(bands, static_cast<float>(rate), channels);

  std::vector<Aud::DynamicLevelControl::DynamicLevelApplyingIterator> levels(automation ? channels : 0);
  const double duration = reader.frames() / rate;
  for (auto& it : levels) {
    if (reverse) {
      it.configureReverse(automation.get(), rate, duration);
    } else {
      it.configureForwards(automation.get(), rate, 0.0);
    }
  }

  PlanarWriter writer(out, channels, reader.sampleRate(), type);
  PlanarBlock block(channels, kBlock);
  std::vector<float*> planes = block.pointers();
  Progress progress("processing", reader.frames(), args.has("quiet"));
  uint64_t done = 0;
  while (done < reader.frames()) {
    std::size_t n;
    if (reverse) {
      const std::size_t want = static_cast<std::size_t>(std::min<uint64_t>(kBlock, reader.frames() - done));
      n = reader.readAt(reader.frames() - done - want, block, want);
      if (n != want) throw WaveError(WaveError::Io, "'" + in + "': short read");
      for (float* p : planes) std::reverse(p, p + n);
    } else {
      n = reader.read(block);
      if (n == 0) break;
    }
    // The kernels work in quads: clear the tail so the last quad is defined.
    const unsigned quads = static_cast<unsigned>((n + 3) / 4);
    for (float* p : planes) std::fill(p + n, p + quads * 4, 0.0f);
    eq.process(planes.data(), static_cast<unsigned>(n));
    if (gain != 1.0f)
      for (float* p : planes) Aud::MixRender::MultiplyConstant(p, p, quads, gain);
    for (unsigned c = 0; c < levels.size(); ++c) levels[c].apply(planes[c], n);
    writer.write(block, n);
    done += n;
    progress.update(done);
  }
  writer.commit();
  progress.finish();
  if (reader.wave().truncated())
    std::fprintf(stderr, "warning: '%s' is truncated; processed what is there\n", in.c_str());
  return kOk;
}

}  // namespace cli
