// tonebits info FILE: the format as the library describes it.
#include <cmath>
#include <cstdio>

#include "AudioIO.h"
#include "Cli.h"
#include "Commands.h"
#include "FrameRates.h"
#include "tonebits/foundation/Aud__FrameCadence.h"
#include "tonebits/foundation/Aud__SampleRate.h"

namespace cli {

namespace {
const char* kHelp =
    "usage: tonebits info FILE [--frame-rate RATE]\n"
    "\n"
    "Describes FILE as the library sees it: coding, sample type, channels,\n"
    "rate, stride and bits, and the duration. With --frame-rate (23.976, 24,\n"
    "25, 29.97, 30, 47.952, 50, 59.94 or 60) it also gives the samples of each\n"
    "video frame over one cycle of the cadence.\n";
}

// The library's rate for a number of hertz: a base rate, or a base with the
// speed-change factor that brings it there.
Aud::SampleRate sampleRateOf(unsigned hertz) {
  const Aud::eBaseSampleRate exact = Aud::SampleRate::calcSampleRate(hertz);
  if (exact != Aud::srNone) return Aud::SampleRate(exact, Aud::eFactor(0));
  for (unsigned base : {48000u, 44100u, 96000u, 32000u, 22050u, 11025u}) {
    Aud::eFactor factor{};
    if (Aud::SampleRate::determineFactorFromFloat(factor, double(hertz) / base) == Aud::sSuccess) {
      Aud::SampleRate rate(Aud::SampleRate::calcSampleRate(base), factor);
      if (std::fabs(rate.calcCombinedSampleRate() - hertz) < 0.5) return rate;
    }
  }
  return Aud::SampleRate();
}

int runInfo(int argc, char** argv, int first) {
  Args args(argc, argv, first, {"frame-rate"}, {"help"});
  if (args.has("help")) {
    std::fputs(kHelp, stdout);
    return kOk;
  }
  if (args.positional().size() != 1) throw UsageError("info takes one FILE");
  const std::string path = args.positional()[0];
  WaveReader wave(path);
  const Aud::Metadata m = metadataOf(wave);
  const WaveFormat& f = wave.format();
  const Aud::SampleRate rate = sampleRateOf(m.getSamplesPerSec());

  std::printf("file:        %s\n", path.c_str());
  std::printf("coding:      %s (WAVE format tag 0x%04X%s)\n",
              static_cast<const char*>(m.CompressionFormatAsString()), f.formatTag,
              f.formatTag == 0xFFFE ? ", extensible" : "");
  std::printf("sample type: %s (%d)\n", sampleTypeName(m.getSampleTypeNumber()).c_str(),
              m.getSampleTypeNumber());
  std::printf("channels:    %u\n", m.getTotalChannels());
  std::printf(
      "rate:        %u Hz (%s)\n", m.getSamplesPerSec(),
      rate.valid() ? static_cast<const char*>(String(Aud::getDisplayString(rate))) : "no library rate");
  std::printf("stride:      %u bytes\n", m.getStride());
  std::printf("bits:        %u", m.getBitsPerSample());
  if (f.validBitsPerSample != f.bitsPerSample) std::printf(" (%u significant)", f.validBitsPerSample);
  std::printf("\nframes:      %llu\n", static_cast<unsigned long long>(wave.frames()));
  const double seconds = m.getSamplesPerSec() ? double(wave.frames()) / m.getSamplesPerSec() : 0.0;
  std::printf("duration:    %.3f s\n", seconds);
  if (wave.truncated())
    std::printf("warning:     data chunk truncated: %llu of %llu frames present\n",
                static_cast<unsigned long long>(wave.frames()),
                static_cast<unsigned long long>(wave.claimedFrames()));

  if (args.has("frame-rate")) {
    const FrameRateName& fr = parseFrameRate(args.value("frame-rate"));
    if (!rate.valid())
      throw UsageError("no cadence for a rate of " + std::to_string(m.getSamplesPerSec()) + " Hz");
    const auto cadence = Aud::Util::getSMPTE_FrameSequence(rate, fr.rate);
    if (cadence.empty()) {
      std::printf("cadence:     none at %s fps for this rate\n", fr.name);
    } else {
      unsigned long long total = 0;
      for (unsigned n : cadence) total += n;
      std::printf("cadence:     %zu frame%s at %s fps, %llu samples per cycle:", cadence.size(),
                  cadence.size() == 1 ? "" : "s", fr.name, total);
      const std::size_t shown = cadence.size() < 20 ? cadence.size() : 20;
      for (std::size_t i = 0; i < shown; ++i) std::printf(" %u", cadence[i]);
      std::printf("%s\n", shown < cadence.size() ? " ..." : "");
    }
  }
  return kOk;
}

}  // namespace cli
