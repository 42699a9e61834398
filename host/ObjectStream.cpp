#include "host/ObjectStream.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

namespace {
constexpr std::size_t kMaxData = std::numeric_limits<unsigned int>::max();
}

// Where the bytes live. Offsets handed to read and write are within or at
// the end of the data; write may extend it.
struct StreamFile::Backing : host::HostAllocated {
  virtual ~Backing() = default;
  virtual std::size_t size() const noexcept = 0;
  virtual void read(std::size_t at, void* out, std::size_t length) = 0;
  virtual bool write(std::size_t at, const void* in, std::size_t length) = 0;
  virtual bool flush() { return true; }
  virtual bool close() { return true; }
  virtual bool isFile() const noexcept { return false; }
  virtual Bytes contents() = 0;
};

// A growable block on the host heap. Grown by doubling, and without zero-
// filling what a write is about to cover: packing writes a few bytes at a
// time at the end.
struct StreamFile::MemoryBacking final : Backing {
  unsigned char* data = nullptr;
  std::size_t bytes = 0;
  std::size_t capacity = 0;

  ~MemoryBacking() override { OS()->allocator()->release(data); }
  void reserve(std::size_t wanted) {
    if (wanted <= capacity) return;
    const std::size_t grown = std::max<std::size_t>({wanted, capacity * 2, 256});
    auto* bigger = static_cast<unsigned char*>(host::allocateOrThrow(grown));
    if (bytes) std::memcpy(bigger, data, bytes);
    OS()->allocator()->release(data);
    data = bigger;
    capacity = grown;
  }
  std::size_t size() const noexcept override { return bytes; }
  void read(std::size_t at, void* out, std::size_t length) override { std::memcpy(out, data + at, length); }
  bool write(std::size_t at, const void* in, std::size_t length) override {
    reserve(at + length);
    std::memcpy(data + at, in, length);
    bytes = std::max(bytes, at + length);
    return true;
  }
  Bytes contents() override { return Bytes(data, data + bytes); }
};

struct StreamFile::FileBacking final : Backing {
  std::FILE* file = nullptr;
  std::size_t bytes = 0;
  bool writable = false;
  // The C library requires a seek between a write and a read; tracking the
  // file's own offset also spares a seek for each sequential access.
  long offset = -1;
  bool lastWasWrite = false;

  ~FileBacking() override { close(); }

  bool seekFor(std::size_t at, bool forWrite) {
    if (offset == static_cast<long>(at) && lastWasWrite == forWrite) return true;
    if (std::fseek(file, static_cast<long>(at), SEEK_SET) != 0) {
      offset = -1;
      return false;
    }
    offset = static_cast<long>(at);
    lastWasWrite = forWrite;
    return true;
  }
  std::size_t size() const noexcept override { return bytes; }
  void read(std::size_t at, void* out, std::size_t length) override {
    std::size_t got = 0;
    if (file && seekFor(at, false)) got = std::fread(out, 1, length, file);
    if (got < length) {
      // The file shrank behind our back or failed: what is missing reads as
      // zero, as at the end of the data.
      std::memset(static_cast<unsigned char*>(out) + got, 0, length - got);
      offset = -1;
    } else {
      offset += static_cast<long>(length);
    }
  }
  bool write(std::size_t at, const void* in, std::size_t length) override {
    if (!file || !writable || !seekFor(at, true)) return false;
    if (std::fwrite(in, 1, length, file) != length) {
      offset = -1;
      return false;
    }
    offset += static_cast<long>(length);
    bytes = std::max(bytes, at + length);
    return true;
  }
  bool flush() override { return !file || std::fflush(file) == 0; }
  bool close() override {
    if (!file) return true;
    const bool ok = std::fclose(file) == 0;
    file = nullptr;
    return ok;
  }
  bool isFile() const noexcept override { return true; }
  Bytes contents() override {
    Bytes all(bytes);
    if (bytes) read(0, all.data(), bytes);
    return all;
  }
};

StreamFile::StreamFile() : backing_(new MemoryBacking) {
  memory_ = static_cast<MemoryBacking*>(backing_.get());
}

StreamFile::StreamFile(const void* bytes, std::size_t length) : StreamFile() {
  if (length > kMaxData) length = kMaxData;
  if (length) memory_->write(0, bytes, length);
}

StreamFile::~StreamFile() = default;

bool StreamFile::open(const char* path, eOpenMode mode) {
  close();
  backing_.reset(new MemoryBacking);
  memory_ = static_cast<MemoryBacking*>(backing_.get());
  shortfall_ = 0;
  writeFailed_ = false;
  const char* how = mode == eReadOnly ? "rb" : mode == eCreate ? "w+b" : "r+b";
  std::FILE* file = path ? std::fopen(path, how) : nullptr;
  if (!file) return false;
  long end = -1;
  if (std::fseek(file, 0, SEEK_END) == 0) end = std::ftell(file);
  if (end < 0 || static_cast<unsigned long>(end) > kMaxData) {
    std::fclose(file);
    return false;
  }
  std::unique_ptr<FileBacking> backing(new FileBacking);
  memory_ = nullptr;
  backing->file = file;
  backing->bytes = static_cast<std::size_t>(end);
  backing->writable = mode != eReadOnly;
  backing_ = std::move(backing);
  position_ = 0;
  shortfall_ = 0;
  writeFailed_ = false;
  return true;
}

bool StreamFile::flush() { return backing_->flush(); }

bool StreamFile::close() {
  // Close even when the flush failed, so the file is never left open.
  const bool flushed = backing_->flush();
  const bool closed = backing_->close();
  const bool ok = flushed && closed;
  if (backing_->isFile()) {
    backing_.reset(new MemoryBacking);
    memory_ = static_cast<MemoryBacking*>(backing_.get());
  }
  position_ = 0;
  return ok;
}

bool StreamFile::isFile() const noexcept { return backing_->isFile(); }

unsigned int StreamFile::size() const noexcept {
  return static_cast<unsigned int>(memory_ ? memory_->size() : backing_->size());
}

void StreamFile::position(unsigned int p) noexcept { position_ = std::min(p, size()); }

StreamFile::Bytes StreamFile::contents() const { return backing_->contents(); }

void StreamFile::putBytes(const void* bytes, std::size_t length) {
  if (length == 0) return;
  if (memory_ && length <= kMaxData - position_) {
    memory_->write(position_, bytes, length);
    position_ += static_cast<unsigned int>(length);
    return;
  }
  if (length > kMaxData - position_ || !backing_->write(position_, bytes, length)) {
    writeFailed_ = true;
    return;
  }
  position_ += static_cast<unsigned int>(length);
}

unsigned int StreamFile::getBytes(void* out, unsigned int length) {
  const unsigned int available = size() - position_;
  const unsigned int n = std::min(length, available);
  if (memory_) {
    if (n) std::memcpy(out, memory_->data + position_, n);
  } else if (n) {
    backing_->read(position_, out, n);
  }
  if (n < length) {
    std::memset(static_cast<unsigned char*>(out) + n, 0, length - n);
    shortfall_ += length - n;
  }
  position_ += n;
  return n;
}

void StreamFile::setFloat(float v) {
  uint32_t bits;
  std::memcpy(&bits, &v, sizeof bits);
  putLittle(bits);
}

float StreamFile::getFloat() {
  const uint32_t bits = getLittle<uint32_t>();
  float v;
  std::memcpy(&v, &bits, sizeof v);
  return v;
}

void StreamFile::writeBinary(const unsigned char* bytes, unsigned int length, bool binary, bool unframed) {
  if (!bytes) length = 0;
  if (!binary && length == 0 && bytes) {
    const std::size_t n = std::strlen(reinterpret_cast<const char*>(bytes));
    length = static_cast<unsigned int>(std::min(n, kMaxData));
  }
  if (!unframed) setUnsignedLong(length);
  putBytes(bytes, length);
}

bool StreamFile::readBinary(GrowString& out, bool binary) {
  out.clear();
  const unsigned int before = position_;
  const unsigned int length = getUnsignedLong();
  const bool headerComplete = position_ - before == 4;
  // Never trust the count beyond the data that is actually there.
  const unsigned int available = size() - position_;
  const unsigned int n = std::min(length, available);
  char chunk[256];
  for (unsigned int done = 0; done < n;) {
    const unsigned int step = std::min<unsigned int>(n - done, sizeof chunk);
    backing_->read(position_, chunk, step);
    position_ += step;
    done += step;
    out.append(chunk, step);
  }
  if (n < length) shortfall_ += length - n;
  if (!binary) {
    const std::size_t zero = out.view().find('\0');
    if (zero != std::string_view::npos) {
      GrowString text(out.c_str(), zero);
      out = text;
    }
  }
  return headerComplete && n == length;
}

unsigned int PStream::layerDataEnd() const noexcept { return std::min(layerEnd_, size()); }

unsigned int PStream::exchangeLayerDataEnd(unsigned int end) noexcept {
  const unsigned int old = layerEnd_;
  layerEnd_ = end;
  return old;
}

DynamicIntegralStorageBase::~DynamicIntegralStorageBase() = default;

PStream& operator<<(PStream& s, const DynamicIntegralStorageBase& number) {
  number.write(s);
  return s;
}

PStream& operator>>(PStream& s, DynamicIntegralStorageBase& number) {
  number.read(s);
  return s;
}
