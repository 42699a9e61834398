// tonebits convert IN OUT --type NAME: re-export in one of the export
// sample types.
#include <cstdio>

#include "AudioIO.h"
#include "Cli.h"
#include "Commands.h"

namespace cli {

namespace {
const char* kHelp =
    "usage: tonebits convert IN OUT --type TYPE [--allow-truncated] [--quiet]\n"
    "\n"
    "Re-exports IN as OUT in one of the export sample types:\n"
    "  \"16 bit\", \"24 bit\", \"24 bit unpacked (4 bytes)\"\n"
    "Samples pass through float with the library's conversion rules (clamped,\n"
    "truncated toward zero). OUT is written whole or not at all.\n";
}

int runConvert(int argc, char** argv, int first) {
  Args args(argc, argv, first, {"type"}, {"help", "allow-truncated", "quiet"});
  if (args.has("help")) {
    std::fputs(kHelp, stdout);
    return kOk;
  }
  if (args.positional().size() != 2) throw UsageError("convert takes IN and OUT");
  if (!args.has("type")) throw UsageError("convert needs --type");
  const std::string in = args.positional()[0], out = args.positional()[1];
  const int type = exportTypeFromName(args.value("type"));
  checkOutput(in, out);

  PlanarReader reader(in, args.has("allow-truncated"));
  PlanarWriter writer(out, reader.channels(), reader.sampleRate(), type);
  PlanarBlock block(reader.channels(), 1 << 14);
  Progress progress("converting", reader.frames(), args.has("quiet"));
  for (std::size_t n; (n = reader.read(block)) > 0;) {
    writer.write(block, n);
    progress.update(reader.wave().position());
  }
  writer.commit();
  progress.finish();
  if (reader.wave().truncated())
    std::fprintf(stderr, "warning: '%s' is truncated; converted what is there\n", in.c_str());
  return kOk;
}

}  // namespace cli
