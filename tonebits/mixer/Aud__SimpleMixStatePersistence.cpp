// The mixer state's persistence: its object-stream layer "AS" and its
// configuration-file sections.
//
// Layer data, revision 1.1 (1.0 has the same bytes, with linear magnitudes
// for levels): valid (char; 0 ends the data), the three stored counts
// (signed 32-bit), input levels, input pans, mix levels (each a byte size
// then floats), the input-to-mix and mix-to-output routing tables (binary
// blocks), then input mutes, input solos, mix mutes, mix solos (each a byte
// size then one char per entry).

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <cstring>
#include <limits>
#include <memory>
#include <string_view>
#include <typeinfo>

#include "host/GrowString.h"
#include "tonebits/dsp/Aud__GainCurve.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace Aud {

namespace {

using eStreamStatus = StreamableTraitsBase::eStatus;

constexpr int kRevisionMajor = 1;
constexpr int kRevisionMinor = 1;

// Levels of revision 1.0 data are linear magnitudes.
float magnitudeToFader(float magnitude) {
  return magnitude == 1.0f ? 1.0f : GainCurve::Curve<2>::mapMagnitudeToUValue(magnitude);
}

}  // namespace

// --- Names and registration ---

String SimpleMixState::layerName() {
  // Demangling costs more than a whole layer's data: once is enough.
  static const String name = Streamable::adjustName(typeid(SimpleMixState).name());
  return name;
}

String SimpleMixState::subHierarchyName(bool withRoot, bool shortNames) {
  const String base = Taggable::subHierarchyName(withRoot, shortNames);
  const String own = shortNames ? String(shortLayerName()) : layerName();
  return base.isEmpty() ? own : base + "." + own;
}

String SimpleMixState::hierarchyName(bool withRoot, bool shortNames) const {
  String text;
  STRM_L_SimpleMixState_buildHierarchyName(text, withRoot, shortNames);
  return text;
}

void SimpleMixState::STRM_L_SimpleMixState_buildHierarchyName(String& text, bool withRoot,
                                                              bool shortNames) const {
  const String own = shortNames ? String(shortLayerName()) : layerName();
  text = text.isEmpty() ? own : own + "." + text;
  Taggable::STRM_L_Taggable_buildHierarchyName(text, withRoot, shortNames);
}

StreamClassRegistrar SimpleMixState::STRM_L_SimpleMixState_registrar_(
    SimpleMixState::subHierarchyName(false, false), SimpleMixState::subHierarchyName(false, true),
    &SimpleMixState::STRM_L_SimpleMixState_builder);

Streamable* SimpleMixState::STRM_L_SimpleMixState_builder(PStream& s) {
  std::unique_ptr<SimpleMixState> state(new SimpleMixState(eBuildForUnpack));
  if (state->STRM_hierarchyUnpack(s) == StreamableTraitsBase::eFailed) return nullptr;
  return state.release();
}

// --- The layer frame ---

// This layer as the shared chunk frame sees it.
class SimpleMixState::StreamLayer final : public StreamableTraitsBase::Layer {
 public:
  StreamLayer(const SimpleMixState& state, SimpleMixState* writable) : state_(state), writable_(writable) {}
  const char* shortLayerName() const override { return SimpleMixState::shortLayerName(); }
  String layerName() const override { return SimpleMixState::layerName(); }
  String objectName() const override { return state_.hierarchyName(false, false); }
  unsigned char revisionMajor() const override { return state_.revisionMajor_; }
  unsigned char revisionMinor() const override { return state_.revisionMinor_; }
  void packData(PStream& s) override { state_.pack(s); }
  void unpackData(PStream& s, unsigned char major, unsigned char minor) override {
    writable_->revisionMajor(major);
    writable_->revisionMinor(minor);
    writable_->unpack(s);
  }

 private:
  const SimpleMixState& state_;
  SimpleMixState* writable_;
};

eStreamStatus SimpleMixState::packLayer(const Streamable* object, PStream& s,
                                        StreamableTraitsBase::PackList* list) {
  const auto* state = static_cast<const SimpleMixState*>(object);
  // The placeholder header carries 1.0; pack moves the revision to what it
  // writes, and the final header carries that.
  state->revisionMajor(1);
  state->revisionMinor(0);
  StreamLayer layer(*state, nullptr);
  return StreamableTraitsBase::packChunk(s, layer, list);
}

eStreamStatus SimpleMixState::STRM_hierarchyPack(PStream& s) const {
  StreamableTraitsBase::PackList list;
  list.push_back({&SimpleMixState::packLayer, this});
  return Taggable::STRM_layerPack(this, s, &list);
}

eStreamStatus SimpleMixState::STRM_layerPack(const SimpleMixState* object, PStream& s,
                                             StreamableTraitsBase::PackList* list) const {
  list->push_front({&SimpleMixState::packLayer, object});
  return Taggable::STRM_layerPack(object, s, list);
}

eStreamStatus SimpleMixState::STRM_hierarchyUnpack(PStream& s) { return STRM_layerUnpack(this, s); }

eStreamStatus SimpleMixState::STRM_layerUnpack(SimpleMixState* object, PStream& s) {
  const eStreamStatus base = Taggable::STRM_layerUnpack(object, s);
  if (!StreamableTraitsBase::isOk(base)) return base;
  StreamLayer layer(*object, object);
  return StreamableTraitsBase::unpackChunk(s, layer);
}

// --- The layer data ---

void SimpleMixState::pack(PStream& s) const {
  revisionMajor(kRevisionMajor);
  revisionMinor(kRevisionMinor);
  if (!valid_) {
    s.setCookedChar(0);
    return;
  }
  s.setCookedChar(1);
  s.setLong(numInputs);
  s.setLong(numMixes);
  s.setLong(numOutputs);
  s.setUnsignedLong(sizeOf(eInputLevels));
  for (const InputChannel& c : inputChannels) s.setFloat(c.level);
  s.setUnsignedLong(sizeOf(eInputPans));
  for (const InputChannel& c : inputChannels) s.setFloat(c.pan);
  s.setUnsignedLong(sizeOf(eMixLevels));
  for (const MixChannel& c : mixChannels) s.setFloat(c.level);
  s.writeBinary(inputToMixRouting.data(), sizeOf(eInputToMixRouting), true, false);
  s.writeBinary(mixToOutputRouting.data(), sizeOf(eMixToOutputRouting), true, false);
  s.setUnsignedLong(sizeOf(eInputMutes));
  for (const InputChannel& c : inputChannels) s.setCookedChar(c.mute ? 1 : 0);
  s.setUnsignedLong(sizeOf(eInputSolos));
  for (const InputChannel& c : inputChannels) s.setCookedChar(c.solo ? 1 : 0);
  s.setUnsignedLong(sizeOf(eMixMutes));
  for (const MixChannel& c : mixChannels) s.setCookedChar(c.mute ? 1 : 0);
  s.setUnsignedLong(sizeOf(eMixSolos));
  for (const MixChannel& c : mixChannels) s.setCookedChar(c.solo ? 1 : 0);
}

bool SimpleMixState::checkUnpackBinary(void* destination, unsigned int size, PStream& s) {
  GrowString block;
  s.readBinary(block, true);
  if (block.length() != size) return false;
  if (size) std::memcpy(destination, block.bytes(), size);
  return true;
}

void SimpleMixState::unpack(PStream& s) {
  valid_ = false;
  dirty = false;
  ByteTable().swap(inputToMixRouting);
  ByteTable().swap(mixToOutputRouting);

  if (revisionMajor_ * 1000 + revisionMinor_ > kRevisionMajor * 1000 + kRevisionMinor) {
    s.messageText().appendf(
        "Encountered unknown version of SoftwareAudioMixer::SimpleMixState (current v%d.%d, encountered "
        "v%d.%d).",
        kRevisionMajor, kRevisionMinor, revisionMajor_, revisionMinor_);
    return;
  }
  if (s.getChar() == 0) return;

  const int32_t ni = s.getLong();
  const int32_t nm = s.getLong();
  const int32_t no = s.getLong();
  // The counts size every table; trust them only when their tables fit in
  // what is left of this layer's data, so that damaged data can neither
  // make us allocate more than it holds nor leave a table half-read.
  const unsigned long long room = s.layerDataEnd() > s.position() ? s.layerDataEnd() - s.position() : 0;
  bool fits = ni >= 0 && nm >= 0 && no >= 0;
  if (fits) {
    const unsigned long long i = static_cast<unsigned long long>(ni);
    const unsigned long long m = static_cast<unsigned long long>(nm);
    const unsigned long long o = static_cast<unsigned long long>(no);
    const unsigned long long needed = 9 * 4 + 10 * i + 6 * m + m * i + 2 * m * o;
    fits = needed <= room;
  }
  if (!fits) {
    s.messageText().append(
        "Encountered invalid table sizes while unpacking SoftwareAudioMixer::SimpleMixState");
    return;
  }
  init(ni, nm, no);

  auto readFloats = [&s](auto& table, auto member) {
    const unsigned int n = std::min<std::size_t>(s.getUnsignedLong() / 4, table.size());
    for (unsigned int j = 0; j < n; ++j) table[j].*member = s.getFloat();
  };
  auto readFlags = [&s](auto& table, auto member) {
    const unsigned int n = std::min<std::size_t>(s.getUnsignedLong(), table.size());
    for (unsigned int j = 0; j < n; ++j) table[j].*member = s.getChar() != 0;
  };
  auto readRouting = [this, &s](ByteTable& table, eTables which) {
    if (checkUnpackBinary(table.data(), sizeOf(which), s)) return true;
    s.messageText().append(
        "Encountered unexpected binary data size while unpacking SoftwareAudioMixer::SimpleMixState");
    return false;
  };

  readFloats(inputChannels, &InputChannel::level);
  readFloats(inputChannels, &InputChannel::pan);
  readFloats(mixChannels, &MixChannel::level);
  if (!readRouting(inputToMixRouting, eInputToMixRouting)) return;
  if (!readRouting(mixToOutputRouting, eMixToOutputRouting)) return;
  readFlags(inputChannels, &InputChannel::mute);
  readFlags(inputChannels, &InputChannel::solo);
  readFlags(mixChannels, &MixChannel::mute);
  readFlags(mixChannels, &MixChannel::solo);

  if (revisionMajor_ == 1 && revisionMinor_ == 0) {
    for (InputChannel& c : inputChannels) c.level = magnitudeToFader(c.level);
    for (MixChannel& c : mixChannels) c.level = magnitudeToFader(c.level);
  }
}

// --- Configuration file ---

namespace {

constexpr const char* kAuthorApp = "Kelvane Editor";
constexpr const char* kAuthorAppVersion = "11.1.0.0";

const String kMainSection("SimpleMixState");
const String kInputFader("SimpleMixState.InputChannels.Fader");
const String kInputPan("SimpleMixState.InputChannels.Pan");
const String kInputMute("SimpleMixState.InputChannels.Mute");
const String kInputSolo("SimpleMixState.InputChannels.Solo");
const String kInputRouteToMix("SimpleMixState.InputChannels.RouteToMix");
const String kMixFader("SimpleMixState.MixChannels.Fader");
const String kMixMute("SimpleMixState.MixChannels.Mute");
const String kMixSolo("SimpleMixState.MixChannels.Solo");
const String kMixRouteToOutput("SimpleMixState.MixChannels.RouteToOutput");

// One "<key>=<value>" line, formatted by hand: the C library's formatted
// printing dominated storing otherwise. The keys are the "%03d" and "%02d"
// forms (zero-padded to the width, wider when the number is), levels "%.10f"
// in the C locale whatever the process locale.
class Line {
 public:
  Line& number(int v, int width) {
    char digits[12];
    int n = 0;
    unsigned u = static_cast<unsigned>(v < 0 ? 0 : v);
    do {
      digits[n++] = static_cast<char>('0' + u % 10);
      u /= 10;
    } while (u);
    for (int pad = n; pad < width; ++pad) put('0');
    while (n) put(digits[--n]);
    return *this;
  }
  Line& put(char c) {
    if (length_ < sizeof text_) text_[length_++] = c;
    return *this;
  }
  Line& put(const char* t) {
    while (*t) put(*t++);
    return *this;
  }
  Line& level(float v) {
    const auto result = std::to_chars(text_ + length_, text_ + sizeof text_, v, std::chars_format::fixed, 10);
    if (result.ec == std::errc()) length_ = static_cast<std::size_t>(result.ptr - text_);
    return *this;
  }
  Line& flag(bool on) { return put(on ? '1' : '0'); }
  void appendTo(KvIniFile::Pairs& pairs) const { pairs.emplace_back(String(text_, length_)); }

 private:
  char text_[96];
  std::size_t length_ = 0;
};

// Scanners with the rules of the C library's scanf conversions, over one
// text and without its undefined behaviour: an integer that does not fit
// saturates (and so is out of every range), and numbers read the same in
// every locale.
bool isScanSpace(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r'; }

void skipSpace(std::string_view& t) {
  while (!t.empty() && isScanSpace(t.front())) t.remove_prefix(1);
}

// "%d"
bool scanInt(std::string_view& t, int& out) {
  skipSpace(t);
  std::size_t k = 0;
  bool negative = false;
  if (k < t.size() && (t[k] == '+' || t[k] == '-')) negative = t[k++] == '-';
  const std::size_t firstDigit = k;
  long long v = 0;
  while (k < t.size() && t[k] >= '0' && t[k] <= '9') {
    if (v < 10'000'000'000LL) v = v * 10 + (t[k] - '0');
    ++k;
  }
  if (k == firstDigit) return false;
  if (negative) v = -v;
  out = static_cast<int>(std::clamp<long long>(v, INT32_MIN, INT32_MAX));
  t.remove_prefix(k);
  return true;
}

// For a decimal number text too large or too small for a float: above 0
// when its magnitude is at least 1.
long long decimalOrder(std::string_view number) {
  const std::size_t e = number.find_first_of("eE");
  long long order = 0;
  if (e != std::string_view::npos) {
    std::string_view exponent = number.substr(e + 1);
    int x = 0;
    if (scanInt(exponent, x)) order = x;
    number = number.substr(0, e);
  }
  const std::size_t point = std::min(number.find('.'), number.size());
  const std::size_t first = number.find_first_of("123456789");
  if (first == std::string_view::npos) return -1;  // all zeros
  return order +
         (first < point ? static_cast<long long>(point - first) : -static_cast<long long>(first - point - 1));
}

// "%f"
bool scanFloat(std::string_view t, float& out) {
  skipSpace(t);
  bool negative = false;
  if (!t.empty() && (t.front() == '+' || t.front() == '-')) {
    negative = t.front() == '-';
    t.remove_prefix(1);
  }
  if (t.empty() || t.front() == '+' || t.front() == '-') return false;
  float v = 0.0f;
  const auto result = std::from_chars(t.data(), t.data() + t.size(), v, std::chars_format::general);
  if (result.ec == std::errc::invalid_argument) return false;
  if (result.ec == std::errc::result_out_of_range) {
    // As strtof: too large gives infinity, too small zero.
    v = decimalOrder(std::string_view(t.data(), static_cast<std::size_t>(result.ptr - t.data()))) > 0
            ? std::numeric_limits<float>::infinity()
            : 0.0f;
  }
  out = negative ? -v : v;
  return true;
}

bool scanLiteral(std::string_view& t, std::string_view literal) {
  if (t.substr(0, literal.size()) != literal) return false;
  t.remove_prefix(literal.size());
  return true;
}

// Attribute "%d" and value "%f".
bool scanIndexedFloat(const Kv::AttribValuePair& pair, int& index, float& value) {
  std::string_view key = pair.attrib().view();
  return pair.valid() && scanInt(key, index) && scanFloat(pair.value().view(), value);
}

// Value "%d", non-zero meaning on.
bool scanFlag(const Kv::AttribValuePair& pair, bool& on) {
  std::string_view value = pair.value().view();
  int n = 0;
  if (!scanInt(value, n)) return false;
  on = n != 0;
  return true;
}

}  // namespace

Aud::eStatus SimpleMixState::storeCompatibleConfigurationInformation(KvIniFile& file) {
  if (!checkValid()) return sSuccess;
  KvIniFile::Pairs& main = file[kMainSection];
  main.clear();
  Line().put("Version=1.1").appendTo(main);
  Line().put("AuthorApp=").put(kAuthorApp).appendTo(main);
  Line().put("AuthorAppVersion=").put(kAuthorAppVersion).appendTo(main);

  const std::size_t ni = static_cast<std::size_t>(numInputs), nm = static_cast<std::size_t>(numMixes);
  KvIniFile::Pairs& inFader = file[kInputFader];
  KvIniFile::Pairs& inPan = file[kInputPan];
  KvIniFile::Pairs& inMute = file[kInputMute];
  KvIniFile::Pairs& inSolo = file[kInputSolo];
  KvIniFile::Pairs& inRoute = file[kInputRouteToMix];
  for (KvIniFile::Pairs* p : {&inFader, &inPan, &inMute, &inSolo}) {
    p->clear();
    p->reserve(ni);
  }
  inRoute.clear();
  inRoute.reserve(ni * nm);
  for (int i = 0; i < numInputs; ++i) {
    Line().number(i, 3).put('=').level(getInputLevel(i)).appendTo(inFader);
    Line().number(i, 3).put('=').level(getInputPan(i)).appendTo(inPan);
    Line().number(i, 3).put('=').flag(getInputMuteState(i)).appendTo(inMute);
    Line().number(i, 3).put('=').flag(getInputSoloState(i)).appendTo(inSolo);
    for (int r = 0; r < numMixes; ++r) {
      Line()
          .number(i, 3)
          .put("->")
          .number(r, 2)
          .put('=')
          .flag(getInputRoutedToMix(i, r - 1))
          .appendTo(inRoute);
    }
  }

  KvIniFile::Pairs& mixFader = file[kMixFader];
  KvIniFile::Pairs& mixMute = file[kMixMute];
  KvIniFile::Pairs& mixSolo = file[kMixSolo];
  KvIniFile::Pairs& mixRoute = file[kMixRouteToOutput];
  for (KvIniFile::Pairs* p : {&mixFader, &mixMute, &mixSolo}) {
    p->clear();
    p->reserve(nm);
  }
  mixRoute.clear();
  mixRoute.reserve(nm * static_cast<std::size_t>(numOutputs) * 2);
  for (int r = 0; r < numMixes; ++r) {
    Line().number(r, 2).put('=').level(getMixLevel(r - 1)).appendTo(mixFader);
    Line().number(r, 2).put('=').flag(getMixMuteState(r - 1)).appendTo(mixMute);
    if (r != 0) Line().number(r, 2).put('=').flag(getMixSoloState(r - 1)).appendTo(mixSolo);
    for (int c = r == 0 ? 2 : 0; c < numOutputs; ++c) {
      Line()
          .number(r, 2)
          .put("L->")
          .number(c, 2)
          .put('=')
          .flag(getMixRoutedToOutput(r - 1, c - 2, true))
          .appendTo(mixRoute);
      Line()
          .number(r, 2)
          .put("R->")
          .number(c, 2)
          .put('=')
          .flag(getMixRoutedToOutput(r - 1, c - 2, false))
          .appendTo(mixRoute);
    }
  }
  return sSuccess;
}

Aud::eStatus SimpleMixState::retrieveCompatibleConfigurationInformation(const KvIniFile& file) {
  if (!checkValid()) return sSuccess;
  resetToDefaultConfiguration(true);

  int major = -1, minor = -1;
  for (const Kv::AttribValuePair& pair : file[kMainSection]) {
    if (!pair.valid() || !pair.attrib().compareCaseInsensitive("version")) continue;
    std::string_view v = pair.value().view();
    if (scanInt(v, major) && scanLiteral(v, ".")) scanInt(v, minor);
  }
  const bool convert = major == 1 && minor == 0;
  auto level = [convert](float v) { return convert ? magnitudeToFader(v) : v; };

  int i = 0, r = 0, c = 0;
  float v = 0.0f;
  bool on = false;
  for (const Kv::AttribValuePair& pair : file[kInputFader]) {
    if (scanIndexedFloat(pair, i, v) && i >= 0 && i < numInputs) setInputLevel(i, level(v));
  }
  for (const Kv::AttribValuePair& pair : file[kInputPan]) {
    if (scanIndexedFloat(pair, i, v) && i >= 0 && i < numInputs) setInputPan(i, v);
  }
  for (const Kv::AttribValuePair& pair : file[kInputRouteToMix]) {
    if (!pair.valid()) continue;
    std::string_view key = pair.attrib().view();
    if (!(scanInt(key, i) && scanLiteral(key, "->") && scanInt(key, r))) continue;
    if (i < 0 || i >= numInputs || r < 0 || r >= numMixes || !scanFlag(pair, on)) continue;
    setInputRoutedToMix(i, r - 1, on);
  }
  for (const Kv::AttribValuePair& pair : file[kMixFader]) {
    if (scanIndexedFloat(pair, r, v) && r >= 0 && r < numMixes) setMixLevel(r - 1, level(v));
  }
  for (const Kv::AttribValuePair& pair : file[kMixRouteToOutput]) {
    if (!pair.valid()) continue;
    std::string_view key = pair.attrib().view();
    if (!scanInt(key, r) || key.empty()) continue;
    const char side = key.front();  // "%c" takes any character, spaces too
    key.remove_prefix(1);
    if (!(scanLiteral(key, "->") && scanInt(key, c))) continue;
    if (r < 0 || r >= numMixes || c < 0 || c >= numOutputs || (side != 'L' && side != 'R')) continue;
    if ((r == 0 && c < 2) || !scanFlag(pair, on)) continue;
    setMixRoutedToOutput(r - 1, c - 2, side == 'L', on);
  }
  return sSuccess;
}

}  // namespace Aud
