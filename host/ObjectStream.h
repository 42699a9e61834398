// Object streams: the byte stores that objects are packed into and unpacked
// from.
//
// StreamFile is a run of bytes with a read/write position, kept either in a
// growable memory buffer or in a file. Every number is written and read
// little-endian whatever the machine: a char is one byte, a short two bytes,
// a long and an unsigned long four bytes, a float a 32-bit IEEE single.
// Writes overwrite at the position and extend the data at its end; reads
// advance the position. A read at the end of the data never goes past it:
// the missing bytes read as zero, the position stops at the end and the
// shortfall is counted (shortfall()), so a reader that over-reads can tell.
// Positions are byte offsets; setting one beyond the data puts it at the end.
//
// Records: writeBinary/readBinary frame a text record or a binary block as
// an unsigned 32-bit byte count followed by the bytes, nothing else (no tag,
// no terminator, no padding). A record whose count points beyond the data
// reads what is there and reports failure, so a damaged count never makes a
// reader allocate more than the data holds.
//
// PStream is a StreamFile that carries what the object layers share while
// packing or unpacking: the stream format version (1 or 2; streams are
// written in version 2, older ones read in version 1), the message text the
// layers append their complaints to, and the end of the layer data being
// read, which bounds what a layer may trust.
//
// DynamicIntegralStorage<S, L> is the variable-length number of version-1
// headers: a value of the wider type L written as one S when below S's
// maximum, else as S's maximum followed by the full L.
//
// A stream is used by one thread at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <type_traits>
#include <vector>

#include "host/GrowString.h"
#include "host/HostExport.h"
#include "host/OS.h"

class HOST_API StreamFile {
 public:
  using Bytes = std::vector<unsigned char, StdAllocator<unsigned char>>;
  enum eOpenMode : int32_t {
    eReadOnly = 0,  // an existing file, for reading; writes fail
    eCreate = 1,    // a new or emptied file, for reading and writing
    eUpdate = 2,    // an existing file, for reading and writing
  };

  // An empty memory buffer.
  StreamFile();
  // A memory buffer holding a copy of length bytes, positioned at 0.
  StreamFile(const void* bytes, std::size_t length);
  virtual ~StreamFile();
  StreamFile(const StreamFile&) = delete;
  StreamFile& operator=(const StreamFile&) = delete;

  // Replaces the store by the file at path; false (and an empty memory
  // buffer) when the file cannot be opened or is 4 GiB or more.
  bool open(const char* path, eOpenMode mode);
  // Writes buffered file data through; false on a write error.
  bool flush();
  // Flushes and closes a file; the stream becomes an empty memory buffer.
  // False when the flush or close failed.
  bool close();
  bool isFile() const noexcept;

  unsigned int position() const noexcept { return position_; }
  void position(unsigned int p) noexcept;
  unsigned int size() const noexcept;
  bool eof() const noexcept { return position_ >= size(); }
  // Bytes requested past the end of the data by reads so far.
  unsigned long long shortfall() const noexcept { return shortfall_; }
  // True once a write could not be stored (a file error, a read-only file, or
  // data that would reach 4 GiB); the write is then dropped.
  bool writeFailed() const noexcept { return writeFailed_; }
  // A copy of all the data.
  Bytes contents() const;

  void setCookedChar(char c) { putBytes(&c, 1); }
  void setUnsignedChar(unsigned char c) { putBytes(&c, 1); }
  void setShort(short v) { putLittle(static_cast<uint16_t>(v)); }
  void setUnsignedShort(unsigned short v) { putLittle(static_cast<uint16_t>(v)); }
  void setLong(int v) { putLittle(static_cast<uint32_t>(v)); }
  void setUnsignedLong(unsigned int v) { putLittle(static_cast<uint32_t>(v)); }
  void setFloat(float v);
  void setBytes(const void* bytes, unsigned int length) { putBytes(bytes, length); }

  char getChar() { return static_cast<char>(getLittle<uint8_t>()); }
  unsigned char getUnsignedChar() { return getLittle<uint8_t>(); }
  short getShort() { return static_cast<short>(getLittle<uint16_t>()); }
  unsigned short getUnsignedShort() { return getLittle<uint16_t>(); }
  int getLong() { return static_cast<int>(getLittle<uint32_t>()); }
  unsigned int getUnsignedLong() { return getLittle<uint32_t>(); }
  float getFloat();
  // Reads up to length bytes into out; what the data lacks is zero-filled.
  // Returns the bytes actually read.
  unsigned int getBytes(void* out, unsigned int length);

  // Writes a record. binary: a block of length bytes. Not binary: a text
  // record of length characters, or of the text up to its terminator when
  // length is 0. unframed: the bytes alone, without the count (for callers
  // with a framing of their own; readBinary cannot read such a record).
  void writeBinary(const unsigned char* bytes, unsigned int length, bool binary, bool unframed);
  // Reads one record written by writeBinary into out (replacing its
  // content). For a text record the content stops at the first zero byte.
  // False, with what could be read, when the data ends inside the record.
  bool readBinary(GrowString& out, bool binary);

 private:
  struct Backing;
  struct MemoryBacking;
  struct FileBacking;

  void putBytes(const void* bytes, std::size_t length);
  template <class U>
  void putLittle(U v) {
    unsigned char b[sizeof(U)];
    for (std::size_t i = 0; i < sizeof(U); ++i) b[i] = static_cast<unsigned char>(v >> (8 * i));
    putBytes(b, sizeof(U));
  }
  template <class U>
  U getLittle() {
    unsigned char b[sizeof(U)];
    getBytes(b, sizeof(U));
    U v = 0;
    for (std::size_t i = 0; i < sizeof(U); ++i) v = static_cast<U>(v | (static_cast<U>(b[i]) << (8 * i)));
    return v;
  }

  std::unique_ptr<Backing> backing_;
  // The bytes when they are in memory (null for a file), so that the typed
  // writes and reads of packing and unpacking skip the virtual call.
  MemoryBacking* memory_ = nullptr;
  unsigned int position_ = 0;
  unsigned long long shortfall_ = 0;
  bool writeFailed_ = false;
};

class HOST_API PStream : public StreamFile {
 public:
  using StreamFile::StreamFile;

  // The format version its headers are read in; 2 unless set.
  int formatVersion() const noexcept { return formatVersion_; }
  void formatVersion(int version) noexcept { formatVersion_ = version; }

  // The text the object layers append their complaints to; callers inspect
  // it after a pack or an unpack. Empty means nothing went wrong.
  GrowString& messageText() noexcept { return message_; }
  const GrowString& messageText() const noexcept { return message_; }

  // The end of the layer data being unpacked (the end of the data when no
  // layer is being read). A layer never trusts a count that would take it
  // beyond this point.
  unsigned int layerDataEnd() const noexcept;
  // Sets the bound and returns the previous one, for the chunk frame.
  unsigned int exchangeLayerDataEnd(unsigned int end) noexcept;

 private:
  int formatVersion_ = 2;
  unsigned int layerEnd_ = std::numeric_limits<unsigned int>::max();
  GrowString message_;
};

// One number whose stored width depends on its value; write and read are its
// two operations, in that order.
class HOST_API DynamicIntegralStorageBase {
 public:
  virtual ~DynamicIntegralStorageBase();
  virtual void write(PStream& s) const = 0;
  virtual void read(PStream& s) = 0;
};

HOST_API PStream& operator<<(PStream& s, const DynamicIntegralStorageBase& number);
HOST_API PStream& operator>>(PStream& s, DynamicIntegralStorageBase& number);

template <class S, class L>
class DynamicIntegralStorage final : public DynamicIntegralStorageBase {
  static_assert(std::is_unsigned_v<S> && std::is_unsigned_v<L> && sizeof(S) < sizeof(L) && sizeof(L) <= 4);

 public:
  DynamicIntegralStorage() noexcept = default;
  explicit DynamicIntegralStorage(L v) noexcept : value(v) {}

  void write(PStream& s) const override {
    constexpr S escape = std::numeric_limits<S>::max();
    if (value < escape) {
      put<S>(s, static_cast<S>(value));
    } else {
      put<S>(s, escape);
      put<L>(s, value);
    }
  }
  void read(PStream& s) override {
    const S small = get<S>(s);
    value = small == std::numeric_limits<S>::max() ? get<L>(s) : small;
  }

  L value = 0;

 private:
  template <class T>
  static void put(PStream& s, T v) {
    if constexpr (sizeof(T) == 1)
      s.setUnsignedChar(v);
    else if constexpr (sizeof(T) == 2)
      s.setUnsignedShort(v);
    else
      s.setUnsignedLong(v);
  }
  template <class T>
  static T get(PStream& s) {
    if constexpr (sizeof(T) == 1)
      return s.getUnsignedChar();
    else if constexpr (sizeof(T) == 2)
      return s.getUnsignedShort();
    else
      return s.getUnsignedLong();
  }
};
