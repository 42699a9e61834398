// Aud::SimpleMixState: the complete settings of a simple software mixer.
//
// Inputs each have a fader level, a pan, a mute and a solo; mix rows (row 0
// the main mix, then the further mixes) each have a level, a mute and a
// solo; a routing table says which inputs feed which mix rows, and another
// which side (left or right) of which mix row feeds which output column
// (columns 0 and 1 the two pseudo outputs, then the physical outputs). The
// object holds settings only; it does no audio processing.
//
// Indices as the accessors take them:
//   input i   0 .. numInputs - 1
//   mix m     -1 .. numMixes - 2     (row m + 1; -1 is the main mix)
//   output o  -2 .. numOutputs - 3   (column o + 2; -2, -1 the pseudo outputs)
// The sized constructor takes the counts a user sees (inputs, further mixes,
// physical outputs) and stores numMixes = mixes + 1, numOutputs = outputs + 2.
//
// Values. A level is a fader position on Aud::GainCurve::Curve<2> (0 the
// bottom, 1 unity); level setters clamp to 0..1.5 (NaN stays). A pan is kept
// as given, 0.5 the centre. The main mix never feeds a pseudo output: those
// entries read false and ignore writes. Switching a physical output on for
// one (mix, side) takes it away from every other mix and side.
//
// Validity. A state made by the default constructor, or left by data that
// could not be unpacked, is not valid: its accessors report "Function called
// on invalid MixerState!" through vel_splat and then return 0.0 or false or
// do nothing. Getters given an index out of range return 0.0 or false;
// setters given one do nothing.
//
// Concurrency. Setters, resetToDefaultConfiguration and copyFrom take the
// state's re-entrant lock; getters, insertInputs, removeInput, the dirty flag
// and the persistence take none: keep writers away while resizing or
// persisting. copyFrom locks both states without deadlock, so two threads
// may copy two states into each other.
//
// Persistence (Aud__SimpleMixStatePersistence.cpp): the object-stream layer
// "AS" (revision 1.1; 1.0 data, whose levels are linear magnitudes, is
// converted when read) and the configuration-file sections "SimpleMixState*".
#pragma once

#include <cstdint>
#include <vector>

#include "host/IniFile.h"
#include "host/Lock.h"
#include "host/OS.h"
#include "host/ObjectStream.h"
#include "host/StreamClassRegistry.h"
#include "host/Streamable.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__Status.h"

namespace Aud {

class TONEBITS_API SimpleMixState : public Taggable {
 public:
  struct InputChannel {
    float level;
    float pan;
    bool mute;
    bool solo;
  };
  struct MixChannel {
    float level;
    bool mute;
    bool solo;
  };
  // The tables as they are persisted.
  enum eTables : int32_t {
    eInputLevels = 0,
    eInputPans = 1,
    eInputMutes = 2,
    eInputSolos = 3,
    eMixLevels = 4,
    eMixMutes = 5,
    eMixSolos = 6,
    eInputToMixRouting = 7,
    eMixToOutputRouting = 8,
  };

  // --- Construction, copying, destruction ---

  // No tables; not valid, not dirty. Filled by copyFrom or by unpacking.
  SimpleMixState();
  // Valid, in the default configuration, not dirty. Negative counts count
  // as 0.
  SimpleMixState(int inputs, int mixes, int outputs);
  // An independent copy: same tag, revision, counts, tables, validity and
  // dirty flag; its own lock.
  SimpleMixState(const SimpleMixState& other);
  ~SimpleMixState() override;
  // copyFrom(source, false).
  SimpleMixState& operator=(SimpleMixState& source);

  // Copies the mixer settings of source (not the tag or revision). An
  // invalid state first takes the source's counts. Counts grow to the larger
  // of the two; when this state was larger in any count, entries the source
  // lacks get their defaults. dirty becomes the source's; takeOverDirty
  // clears the source's.
  void copyFrom(SimpleMixState& source, bool takeOverDirty);

  // A new state equal in every entry, with a fresh tag.
  Taggable* clone() override;
  // A new, empty, not valid state with this one's tag and revision, ready to
  // be unpacked into; the type is ignored.
  Streamable* clone(Streamable::BuilderType type) override;

  // --- State ---

  bool valid() const noexcept { return valid_; }
  void setDirty() noexcept { dirty = true; }
  void clearDirty() noexcept { dirty = false; }
  bool getDirty() const noexcept { return dirty; }
  // The revision of the layer data last written or read; 1.0 before either.
  unsigned char revisionMajor() const noexcept { return revisionMajor_; }
  unsigned char revisionMinor() const noexcept { return revisionMinor_; }

  // --- Accessors ---

  float getInputLevel(int i);
  void setInputLevel(int i, float v);
  float getInputPan(int i);
  void setInputPan(int i, float v);
  bool getInputMuteState(int i);
  void setInputMuteState(int i, bool on);
  bool getInputSoloState(int i);
  void setInputSoloState(int i, bool on);
  bool getInputRoutedToMix(int i, int m);
  void setInputRoutedToMix(int i, int m, bool on);
  float getMixLevel(int m);
  void setMixLevel(int m, float v);
  bool getMixMuteState(int m);
  void setMixMuteState(int m, bool on);
  bool getMixSoloState(int m);
  void setMixSoloState(int m, bool on);
  bool getMixRoutedToOutput(int m, int o, bool left);
  // Off, or a pseudo output: sets the one entry. On for a physical output:
  // the entry becomes the output's only feed. Sets dirty even when the entry
  // does not exist.
  void setMixRoutedToOutput(int m, int o, bool left, bool on);

  // --- Whole-state operations ---

  // Routing cleared; every input at level 1.0, pan 0.5, no mute or solo,
  // routed to the main mix; every mix row at level 1.0, no mute or solo; the
  // main mix's left side to physical output 0 and its right side to
  // physical output 1. Routes whose mix row or output does not exist are
  // left out. markDirty sets dirty; otherwise it keeps its value.
  void resetToDefaultConfiguration(bool markDirty);
  // Inserts count default input records before position, dropping records
  // off the end so that the count stays; routing untouched. Nothing when
  // position is not an input.
  void insertInputs(unsigned long long count, unsigned long long position);
  // Removes the record at index, appending a default record at the end;
  // routing untouched. Nothing when index is not an input.
  void removeInput(unsigned long long index);

  // --- Configuration file ---

  // Writes the sections "SimpleMixState", "SimpleMixState.InputChannels.*"
  // and "SimpleMixState.MixChannels.*", each emptied first. sSuccess.
  Aud::eStatus storeCompatibleConfigurationInformation(KvIniFile& file);
  // Resets to the defaults (marking dirty), then applies every level, pan
  // and route in the file whose indices exist here; revision 1.0 files'
  // levels are converted from magnitudes. Mutes and solos are not read.
  // sSuccess.
  Aud::eStatus retrieveCompatibleConfigurationInformation(const KvIniFile& file);

  // --- Object stream ---

  StreamableTraitsBase::eStatus STRM_hierarchyUnpack(PStream& s) override;
  StreamableTraitsBase::eStatus STRM_hierarchyPack(PStream& s) const override;
  String hierarchyName(bool withRoot, bool shortNames) const override;

  // Adjusted run-time type name, "Aud__SimpleMixState".
  static String layerName();
  static const char* shortLayerName() noexcept { return "AS"; }
  static String subHierarchyName(bool withRoot, bool shortNames);
  // Makes a state and unpacks it from s; null when the layers report a
  // failure (6), a state (maybe not valid) otherwise.
  static Streamable* STRM_L_SimpleMixState_builder(PStream& s);

  // For a class derived from this one, to chain its own layer behind.
  StreamableTraitsBase::eStatus STRM_layerPack(const SimpleMixState* object, PStream& s,
                                               StreamableTraitsBase::PackList* list) const;
  StreamableTraitsBase::eStatus STRM_layerUnpack(SimpleMixState* object, PStream& s);

 protected:
  // For the builder: revision 1.0, no tables, not valid.
  explicit SimpleMixState(Streamable::BuilderType type);
  // For cloning: the original's tag and revision; no tables, not valid.
  SimpleMixState(Streamable::BuilderType type, const SimpleMixState& original);

  void STRM_L_SimpleMixState_buildHierarchyName(String& text, bool withRoot, bool shortNames) const;

 private:
  using InputTable = std::vector<InputChannel, StdAllocator<InputChannel>>;
  using MixTable = std::vector<MixChannel, StdAllocator<MixChannel>>;
  using ByteTable = std::vector<unsigned char, StdAllocator<unsigned char>>;
  class StreamLayer;

  void revisionMajor(unsigned char v) const noexcept { revisionMajor_ = v; }
  void revisionMinor(unsigned char v) const noexcept { revisionMinor_ = v; }

  // Stored counts: no +1 or +2. Negative counts count as 0.
  void init(int inputs, int mixes, int outputs);
  // Reports a call on an invalid state; true when valid.
  bool checkValid() const;
  uint32_t sizeOf(eTables table) const noexcept;

  float* ptrInputLevel(int i);
  float* ptrInputPan(int i);
  bool* ptrInputMuteState(int i);
  bool* ptrInputSoloState(int i);
  float* ptrMixLevel(int m);
  bool* ptrMixMuteState(int m);
  bool* ptrMixSoloState(int m);
  unsigned char* ptrInputRoutedToMix(int i, int m);
  unsigned char* ptrMixRoutedToOutput(int m, int o, bool left);

  template <class T>
  void store(T* entry, T value);

  void pack(PStream& s) const;
  void unpack(PStream& s);
  bool checkUnpackBinary(void* destination, unsigned int size, PStream& s);

  static StreamableTraitsBase::eStatus packLayer(const Streamable* object, PStream& s,
                                                 StreamableTraitsBase::PackList* list);
  static StreamClassRegistrar STRM_L_SimpleMixState_registrar_;

  mutable unsigned char revisionMajor_ = 1;
  mutable unsigned char revisionMinor_ = 0;
  int32_t numInputs = 0;
  int32_t numMixes = 0;
  int32_t numOutputs = 0;
  InputTable inputChannels;
  MixTable mixChannels;
  ByteTable inputToMixRouting;
  ByteTable mixToOutputRouting;
  criticalSection lock;
  bool valid_ = false;
  bool dirty = false;
};

}  // namespace Aud
