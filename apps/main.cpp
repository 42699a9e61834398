// tonebits: the library's command-line tool.
#include <cstdio>
#include <cstring>
#include <exception>
#include <string>

#include "Cli.h"
#include "Commands.h"
#include "WaveFile.h"
#include "tonebits/foundation/Aud__Status.h"

namespace {

struct Command {
  const char* name;
  int (*run)(int, char**, int);
  const char* summary;
};

const Command kCommands[] = {
    {"demo", cli::runDemo, "synthesise a test programme, run it through the whole chain, write demo.wav"},
    {"info", cli::runInfo, "describe a WAVE file's format, duration and frame cadence"},
    {"meter", cli::runMeter, "per-channel peak and clip count"},
    {"convert", cli::runConvert, "re-export a WAVE file in another sample type"},
    {"process", cli::runProcess, "gain, equaliser and level automation"},
    {"mix", cli::runMix, "mix inputs through a mixer state"},
    {"plot", cli::runPlot, "SVG of an equaliser response, a fader law or an envelope"},
};

void usage(std::FILE* out) {
  std::fprintf(out, "usage: tonebits COMMAND [OPTIONS] [ARGS]\n\ncommands:\n");
  for (const Command& c : kCommands) std::fprintf(out, "  %-8s %s\n", c.name, c.summary);
  std::fprintf(out, "\n'tonebits COMMAND --help' describes one command. Version %s.\n",
               tonebitsDllVersionStr());
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2 || !std::strcmp(argv[1], "--help") || !std::strcmp(argv[1], "-h") ||
      !std::strcmp(argv[1], "help")) {
    usage(argc < 2 ? stderr : stdout);
    return argc < 2 ? cli::kUsage : cli::kOk;
  }
  if (!std::strcmp(argv[1], "--version")) {
    std::printf("tonebits %s\n", tonebitsDllVersionStr());
    return cli::kOk;
  }
  for (const Command& c : kCommands) {
    if (std::strcmp(argv[1], c.name) != 0) continue;
    try {
      return c.run(argc, argv, 2);
    } catch (const cli::UsageError& e) {
      std::fprintf(stderr, "tonebits %s: %s\n(see 'tonebits %s --help')\n", c.name, e.what(), c.name);
      return cli::kUsage;
    } catch (const cli::WaveError& e) {
      std::fprintf(stderr, "tonebits %s: %s\n", c.name, e.what());
      return e.kind();
    } catch (const std::exception& e) {
      std::fprintf(stderr, "tonebits %s: %s\n", c.name, e.what());
      return cli::kIo;
    }
  }
  std::fprintf(stderr, "tonebits: unknown command '%s'\n\n", argv[1]);
  usage(stderr);
  return cli::kUsage;
}
