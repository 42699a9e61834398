// Arbitrary bytes into the mixer state's builder, found through the class
// registry. Whatever the bytes, the builder must not crash or over-allocate,
// and must give either a state (valid, or not valid with a reason) or null
// with a message. A valid state must pack and unpack to the same bytes.
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>

#include "host/StreamClassRegistry.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

void require(bool condition) {
  if (!condition) __builtin_trap();
}

StreamFile::Bytes packed(const Aud::SimpleMixState& s) {
  PStream out;
  require(s.STRM_hierarchyPack(out) == StreamableTraitsBase::ePacked);
  return out.contents();
}

}  // namespace

// The frame prints its unread-data warning to standard output; the fuzzer
// reports on standard error, so the warnings are dropped to keep it fast.
extern "C" int LLVMFuzzerInitialize(int*, char***) {
  if (!std::freopen("/dev/null", "w", stdout)) return 0;
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const uint8_t mode = data[0];
  PStream s(data + 1, size - 1);
  if (mode & 1) s.formatVersion(1);

  std::unique_ptr<Streamable> object;
  if (mode & 2) {
    object = StreamClassRegistry::readObject(s);
  } else {
    const StreamClassRegistrar::Builder build = StreamClassRegistry::find("TG.AS");
    require(build != nullptr);
    object.reset(build(s));
  }
  require(s.position() <= s.size());
  if (!object) {
    require(!s.messageText().isEmpty());
    return 0;
  }
  auto* state = dynamic_cast<Aud::SimpleMixState*>(object.get());
  if (!state || !state->valid()) return 0;

  // A state read back must be a whole, usable one.
  require(!state->getDirty());
  const StreamFile::Bytes first = packed(*state);
  PStream again(first.data(), first.size());
  std::unique_ptr<Streamable> copy(Aud::SimpleMixState::STRM_L_SimpleMixState_builder(again));
  require(copy != nullptr && again.messageText().isEmpty() && again.eof());
  auto& second = static_cast<Aud::SimpleMixState&>(*copy);
  require(second.valid());
  require(packed(second) == first);
  return 0;
}
