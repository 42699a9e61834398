#include <cstdio>

#include "host/host.h"
#include "tonebits/tonebits.h"

int main() {
  const float in[2] = {0.5f, -1.0f};
  unsigned char out[4];
  if (!Aud::convertFromFloat(1, in, out, 2)) return 1;
  std::printf("tonebits %s: %s\n", tonebitsDllVersionStr(), Aud::getDebugString(Aud::sSuccess));
  return out[3] == 0x80 ? 0 : 1;
}
