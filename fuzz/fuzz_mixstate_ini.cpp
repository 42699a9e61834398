// Arbitrary text into an INI file and into a mixer state's retrieve. The
// first three bytes choose the state's size. Whatever the text, nothing may
// crash, the state stays valid with each physical output fed at most once,
// and what it stores reads back to the same routing.
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "host/IniFile.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

void require(bool condition) {
  if (!condition) __builtin_trap();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 3) return 0;
  const int ni = data[0] % 24, nm = data[1] % 6, no = data[2] % 10;
  KvIniFile file;
  file.parse(std::string_view(reinterpret_cast<const char*>(data + 3), size - 3));

  // The text form is stable: what is written reads back to itself.
  const NarrowString text = file.text();
  KvIniFile reread;
  reread.parse(std::string_view(text.data(), text.size()));
  require(reread.text() == text);

  Aud::SimpleMixState state(ni, nm, no);
  require(state.retrieveCompatibleConfigurationInformation(file) == Aud::sSuccess);
  require(state.valid() && state.getDirty());
  for (int i = 0; i < ni; ++i) {
    const float level = state.getInputLevel(i);
    require(!(level < 0.0f) && !(level > 1.5f));
    require(!state.getInputMuteState(i) && !state.getInputSoloState(i));
  }
  for (int o = 0; o < no; ++o) {
    int feeds = 0;
    for (int m = -1; m < nm; ++m)
      feeds += state.getMixRoutedToOutput(m, o, true) + state.getMixRoutedToOutput(m, o, false);
    require(feeds <= 1);
  }

  KvIniFile stored;
  state.storeCompatibleConfigurationInformation(stored);
  Aud::SimpleMixState back(ni, nm, no);
  back.retrieveCompatibleConfigurationInformation(stored);
  for (int m = -1; m < nm; ++m) {
    for (int i = 0; i < ni; ++i) require(back.getInputRoutedToMix(i, m) == state.getInputRoutedToMix(i, m));
    for (int o = -2; o < no; ++o) {
      require(back.getMixRoutedToOutput(m, o, true) == state.getMixRoutedToOutput(m, o, true));
      require(back.getMixRoutedToOutput(m, o, false) == state.getMixRoutedToOutput(m, o, false));
    }
  }
  return 0;
}
