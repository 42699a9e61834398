// Feeds arbitrary bytes to the sample-rate text reader. Whatever it reads
// must print and read back as the same rate.
#include <cstddef>
#include <cstdint>
#include <cstdio>

#include "host/HostHooks.h"
#include "host/String.h"
#include "tonebits/foundation/Aud__SampleRate.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  // The reader warns on the console and on standard output for bad text,
  // which is nearly every input here.
  host::setLogSink([](const char*) {});
  if (!std::freopen("/dev/null", "w", stdout)) return 0;
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, std::size_t size) {
  const String text(reinterpret_cast<const char*>(data), size);
  const Aud::SampleRate rate(text);
  const String written = rate.asString();
  if (!(Aud::SampleRate(written) == rate)) __builtin_trap();
  // The display texts cover every base and flag pattern the word can hold.
  (void)Aud::getDisplayString(rate);
  (void)Aud::SampleRate::calcFactor(rate.factor());
  (void)Aud::SampleRate::invert(rate.factor());
  return 0;
}
