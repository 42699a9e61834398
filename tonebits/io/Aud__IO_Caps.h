// What a piece of audio hardware can do: the kinds of physical connection it
// offers, the kinds of clock it can lock to, and the clock source chosen.
//
// IO_ConnectionTypeInfo and IO_SyncSourceTypeInfo are handles to shared,
// immutable records (Rep) that the host's hardware layer builds and keeps
// alive for as long as any handle refers to them; a handle never frees its
// record, and a default-constructed handle has none (it is invalid). Handles
// are made from records only through IO_CapsFactory:
//
//   static const Aud::IO_ConnectionTypeInfo::Rep kAes = {
//       .gainControl = false, .minGain = 0.0, .maxGain = 0.0,
//       .absoluteSRCRange = true, .srcLowerBound = 32000.0, .srcUpperBound = 96000.0,
//       .src = true, .srcDisplayText = String("32 to 96 kHz"),
//       .connectionClass = Aud::ccDigital, .connectionType = Aud::ctAES_EBU};
//   Aud::IO_ConnectionTypeInfo aes = Aud::IO_CapsFactory::makeConnectionTypeInfo(kAes);
//
// Queries on an invalid handle (all but type(), which gives 0) report
// "Method called on invalid IO_..._TypeInfo object" through vel_splat and
// return false, 0 or empty text.
//
// AudCapsVector<T, E> is a vector of such handles looked up by their type.
// IO_SyncSource is a plain value: a sync source type and a 0-based input.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "host/OS.h"
#include "host/String.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__SampleRate.h"
#include "tonebits/foundation/Aud__Status.h"

namespace Aud {

enum eIO_ConnectionType : int32_t {
  ctNone = 0,  // the type of a handle without a record
  ctAnalogue = 2,
  ctAES_EBU = 3,
  ct1394 = 4,
  ctADAT = 5,
  ctSPDIF = 6,
  ctSDI = 7,
  ctHDMI = 9,
};

enum eIO_ConnectionClass : int32_t {
  ccAnalogue = 1,
  ccDigital = 2,
  ccMixer = 3,
};

enum eIO_SyncSourceType : int32_t {
  ssNone = 0,
  ssFreeRunning = 1,
  ssVideo = 2,
  ssLTC = 3,
  ssAES_EBU = 4,
};

// The connection's name; unknown values get the host's "invalid" text.
TONEBITS_API WString getDisplayString(eIO_ConnectionType type);
// "Free Running", "Video", "LTC" or "AES/EBU"; any other value is reported
// through vel_splat as "Dodgy enum!" and gives empty text.
TONEBITS_API WString getDisplayString(eIO_SyncSourceType type);

class IO_CapsFactory;

class TONEBITS_API IO_ConnectionTypeInfo {
 public:
  struct Rep {
    bool gainControl;       // the connection's level can be set
    double minGain;         // lower end of the settable level
    double maxGain;         // upper end of the settable level
    bool absoluteSRCRange;  // the bounds are rates in Hz, not fractions of a reference
    double srcLowerBound;   // lowest rate, or the fraction below the reference
    double srcUpperBound;   // highest rate, or the fraction above the reference
    bool src;               // the connection can convert sample rates
    String srcDisplayText;  // describes the conversion capability
    eIO_ConnectionClass connectionClass;
    eIO_ConnectionType connectionType;
  };

  IO_ConnectionTypeInfo() noexcept = default;
  IO_ConnectionTypeInfo(const IO_ConnectionTypeInfo&) noexcept = default;
  IO_ConnectionTypeInfo& operator=(const IO_ConnectionTypeInfo&) noexcept = default;
  ~IO_ConnectionTypeInfo() = default;

  bool supportsGainControl() const;
  double mininumGain() const;
  double maximumGain() const;
  bool supportsSRC() const;
  eIO_ConnectionClass getConnectionClass() const;
  bool isAnalogue() const;
  bool isDigital() const;
  bool isMixer() const;
  // The record's type, or ctNone without a record (not reported).
  eIO_ConnectionType type() const noexcept;

  // Whether rate can be converted to or from, given the reference rate.
  // True for any connection that is not digital; false for a digital one
  // without conversion; otherwise rate must lie, inclusively, within the
  // absolute bounds or within reference * (1 - lower) to reference * (1 +
  // upper). A NaN rate is never supported. Throws as the rates do for
  // srProject.
  bool supportsSRC(const SampleRate& reference, const SampleRate& rate) const;

  WString getDisplayString() const;
  WString getSRCDisplayString() const;

 private:
  friend class IO_CapsFactory;
  explicit IO_ConnectionTypeInfo(const Rep* rep) noexcept : rep_(rep) {}
  // Reports and returns null when there is no record.
  const Rep* checked() const;

  const Rep* rep_ = nullptr;
};

class TONEBITS_API IO_SyncSourceTypeInfo {
 public:
  struct Rep {
    unsigned int numInputs;  // how many sources of this type the device has
    eIO_SyncSourceType type;
  };

  IO_SyncSourceTypeInfo() noexcept = default;
  IO_SyncSourceTypeInfo(const IO_SyncSourceTypeInfo&) noexcept = default;
  IO_SyncSourceTypeInfo& operator=(const IO_SyncSourceTypeInfo&) noexcept = default;
  ~IO_SyncSourceTypeInfo() = default;

  unsigned int numInputs() const;
  // The record's type, or ssNone without a record (not reported).
  eIO_SyncSourceType type() const noexcept;

 private:
  friend class IO_CapsFactory;
  explicit IO_SyncSourceTypeInfo(const Rep* rep) noexcept : rep_(rep) {}

  const Rep* rep_ = nullptr;
};

// The one way to make a handle from a record. The caller keeps the record
// alive, unchanged, for as long as any handle (or copy) refers to it; a null
// record gives an invalid handle.
class TONEBITS_API IO_CapsFactory {
 public:
  static IO_ConnectionTypeInfo makeConnectionTypeInfo(const IO_ConnectionTypeInfo::Rep* rep) noexcept {
    return IO_ConnectionTypeInfo(rep);
  }
  static IO_ConnectionTypeInfo makeConnectionTypeInfo(const IO_ConnectionTypeInfo::Rep& rep) noexcept {
    return IO_ConnectionTypeInfo(&rep);
  }
  static IO_SyncSourceTypeInfo makeSyncSourceTypeInfo(const IO_SyncSourceTypeInfo::Rep* rep) noexcept {
    return IO_SyncSourceTypeInfo(rep);
  }
  static IO_SyncSourceTypeInfo makeSyncSourceTypeInfo(const IO_SyncSourceTypeInfo::Rep& rep) noexcept {
    return IO_SyncSourceTypeInfo(&rep);
  }
};

class TONEBITS_API IO_SyncSource {
 public:
  static constexpr unsigned int kNoInput = 0xFFFFFFFF;

  IO_SyncSource();
  explicit IO_SyncSource(eIO_SyncSourceType type, unsigned int inputNumber = kNoInput);
  IO_SyncSource(const IO_SyncSource& other);
  IO_SyncSource& operator=(const IO_SyncSource& other) noexcept;
  ~IO_SyncSource();

  eIO_SyncSourceType type() const noexcept { return record_->type; }
  eStatus type(eIO_SyncSourceType type) noexcept;
  unsigned int inputNumber() const noexcept { return record_->inputNumber; }
  eStatus inputNumber(unsigned int inputNumber) noexcept;

  bool valid() const noexcept { return true; }
  // Type ssNone, input kNoInput: equal to a default-constructed source.
  void reset() noexcept;

  bool operator==(const IO_SyncSource& other) const noexcept;

  // The type's text, then " 1&2" or " 3&4" for AES/EBU (input 0 or any
  // other), else a blank and input + 1 in decimal (kNoInput shows as 0).
  WString getDisplayString() const;

 private:
  struct Record : host::HostAllocated {
    eIO_SyncSourceType type;
    unsigned int inputNumber;
  };
  std::unique_ptr<Record> record_;  // never null
};

// A vector of capability handles with lookup by the handles' type().
template <class T, class E>
class AudCapsVector : public std::vector<T, StdAllocator<T>> {
 public:
  using Base = std::vector<T, StdAllocator<T>>;

  explicit AudCapsVector(const StdAllocator<T>& allocator = StdAllocator<T>()) : Base(allocator) {}
  AudCapsVector(const Base& elements) : Base(elements) {}  // NOLINT(google-explicit-constructor)
  AudCapsVector(const AudCapsVector& other) = default;
  ~AudCapsVector() = default;
  AudCapsVector& operator=(const AudCapsVector& other) = default;

  // The index of the first element of that type, or size() when none is.
  unsigned long long find(E type) const;
  // A copy of the first element of that type, or an invalid T when none is.
  // It hides the vector's positional subscript: index with at() instead.
  T operator[](E type) const;
};

template <class T, class E>
unsigned long long AudCapsVector<T, E>::find(E type) const {
  unsigned long long i = 0;
  for (const T& element : *this) {
    if (element.type() == type) return i;
    ++i;
  }
  return i;
}

template <class T, class E>
T AudCapsVector<T, E>::operator[](E type) const {
  for (const T& element : *this) {
    if (element.type() == type) return element;
  }
  return T();
}

}  // namespace Aud

extern template class TONEBITS_API
    std::vector<Aud::IO_ConnectionTypeInfo, StdAllocator<Aud::IO_ConnectionTypeInfo>>;
extern template class TONEBITS_API
    std::vector<Aud::IO_SyncSourceTypeInfo, StdAllocator<Aud::IO_SyncSourceTypeInfo>>;
namespace Aud {
extern template class TONEBITS_API AudCapsVector<IO_ConnectionTypeInfo, eIO_ConnectionType>;
extern template class TONEBITS_API AudCapsVector<IO_SyncSourceTypeInfo, eIO_SyncSourceType>;
}  // namespace Aud
