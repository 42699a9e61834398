// tonebits mix OUT IN...: every channel of the inputs is one mixer input;
// a mixer state (its configuration-file form) gives the levels, pans, mutes,
// solos and routing, and OUT holds the physical outputs.
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "AudioIO.h"
#include "Cli.h"
#include "Commands.h"
#include "MixEngine.h"
#include "host/IniFile.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace cli {

namespace {

const char* kHelp =
    "usage: tonebits mix OUT IN... [--state STATE.ini] [--outputs N] [--type TYPE] [--quiet]\n"
    "\n"
    "Each channel of each IN, in order, is one mixer input. STATE.ini is a\n"
    "mixer state in its configuration-file form (sections SimpleMixState.*):\n"
    "input faders (fader positions, 1.0 unity), pans (0 left, 0.5 centre, 1\n"
    "right, constant power), mutes, solos, routing to mixes, mix faders,\n"
    "mutes and solos, and which side of which mix feeds which output. Without\n"
    "--state every input feeds the main mix at unity, centred, and the main\n"
    "mix feeds outputs 1 and 2. OUT has one channel per physical output: N,\n"
    "or as many as the state routes to (at least 2).\n";

constexpr std::size_t kBlock = 1 << 13;

// The largest index a section's keys use, by the key's leading number or
// by the number after "->".
int largestIndex(const KvIniFile& ini, const char* section, bool afterArrow) {
  int largest = -1;
  for (const Kv::AttribValuePair& pair : ini[section]) {
    if (!pair.valid()) continue;
    const char* key = pair.attrib();
    if (afterArrow) {
      const char* arrow = std::strstr(key, "->");
      if (!arrow) continue;
      key = arrow + 2;
    }
    char* end = nullptr;
    const long v = std::strtol(key, &end, 10);
    if (end != key && v >= 0 && v < 4096) largest = std::max(largest, static_cast<int>(v));
  }
  return largest;
}

// Mutes and solos are kept in the file but not restored by the state's own
// reader; a mixdown honours them, so they are applied here.
void applySwitches(const KvIniFile& ini, Aud::SimpleMixState& state, int inputs, int mixRows) {
  struct Section {
    const char* name;
    bool input, mute;
  };
  const Section sections[] = {{"SimpleMixState.InputChannels.Mute", true, true},
                              {"SimpleMixState.InputChannels.Solo", true, false},
                              {"SimpleMixState.MixChannels.Mute", false, true},
                              {"SimpleMixState.MixChannels.Solo", false, false}};
  for (const Section& s : sections) {
    for (const Kv::AttribValuePair& pair : ini[s.name]) {
      int index = -1, on = 0;
      if (!pair.valid() || std::sscanf(pair.attrib(), "%d", &index) != 1 ||
          std::sscanf(pair.value(), "%d", &on) != 1)
        continue;
      if (s.input && index >= 0 && index < inputs) {
        s.mute ? state.setInputMuteState(index, on != 0) : state.setInputSoloState(index, on != 0);
      } else if (!s.input && index >= 0 && index < mixRows) {
        s.mute ? state.setMixMuteState(index - 1, on != 0) : state.setMixSoloState(index - 1, on != 0);
      }
    }
  }
}

}  // namespace

int runMix(int argc, char** argv, int first) {
  Args args(argc, argv, first, {"state", "outputs", "type"}, {"help", "quiet", "allow-truncated"});
  if (args.has("help")) {
    std::fputs(kHelp, stdout);
    return kOk;
  }
  if (args.positional().size() < 2) throw UsageError("mix takes OUT and at least one IN");
  const std::string out = args.positional()[0];
  std::vector<std::unique_ptr<PlanarReader>> readers;
  int inputs = 0;
  for (std::size_t k = 1; k < args.positional().size(); ++k) {
    checkOutput(args.positional()[k], out);
    readers.push_back(std::make_unique<PlanarReader>(args.positional()[k], args.has("allow-truncated")));
    if (readers.back()->sampleRate() != readers.front()->sampleRate())
      throw UsageError("inputs differ in sample rate: '" + args.positional()[k] + "'");
    inputs += static_cast<int>(readers.back()->channels());
  }
  if (inputs > 256) throw UsageError("at most 256 mixer inputs");

  KvIniFile ini;
  if (args.has("state") && !ini.load(args.value("state").c_str()))
    throw WaveError(WaveError::Io, "'" + args.value("state") + "': cannot read the mixer state");
  const int mixRows =
      std::max(1, std::max(largestIndex(ini, "SimpleMixState.MixChannels.Fader", false),
                           largestIndex(ini, "SimpleMixState.InputChannels.RouteToMix", true)) +
                      1);
  int outputs = largestIndex(ini, "SimpleMixState.MixChannels.RouteToOutput", true) - 1;
  if (args.has("outputs"))
    outputs = static_cast<int>(parseNumber(args.value("outputs"), "output count", 1, 32));
  outputs = std::max(outputs, args.has("outputs") ? 1 : 2);

  Aud::SimpleMixState state(inputs, mixRows - 1, outputs);
  state.resetToDefaultConfiguration(false);
  if (args.has("state")) {
    state.retrieveCompatibleConfigurationInformation(ini);
    applySwitches(ini, state, inputs, mixRows);
  }

  MixEngine engine(state, inputs, mixRows, outputs);

  uint64_t frames = 0;
  for (const auto& r : readers) frames = std::max(frames, r->frames());
  const int type = args.has("type") ? exportTypeFromName(args.value("type")) : 2;
  PlanarWriter writer(out, static_cast<unsigned>(outputs), readers.front()->sampleRate(), type);
  std::vector<std::unique_ptr<PlanarBlock>> blocks;
  for (const auto& r : readers) blocks.push_back(std::make_unique<PlanarBlock>(r->channels(), kBlock));
  PlanarBlock result(static_cast<unsigned>(outputs), kBlock);
  std::vector<float*> inputPlanes, outputPlanes = result.pointers();
  for (auto& b : blocks)
    for (float* p : b->pointers()) inputPlanes.push_back(p);
  Progress progress("mixing", frames, args.has("quiet"));

  for (uint64_t done = 0; done < frames;) {
    const std::size_t n = static_cast<std::size_t>(std::min<uint64_t>(kBlock, frames - done));
    const unsigned quads = static_cast<unsigned>((n + 3) / 4);
    for (std::size_t k = 0; k < readers.size(); ++k) {
      PlanarBlock& block = *blocks[k];
      const std::size_t got = readers[k]->readAt(done, block, n);
      // Past its end an input is silent; the kernels work in whole quads.
      for (unsigned c = 0; c < block.channels(); ++c)
        std::fill(block.channel(c) + got, block.channel(c) + quads * 4, 0.0f);
    }
    engine.process(inputPlanes.data(), outputPlanes.data(), quads);
    writer.write(result, n);
    done += n;
    progress.update(done);
  }
  writer.commit();
  progress.finish();
  return kOk;
}

}  // namespace cli
