// The host's exception values. Every text is static; the library throws
// RuntimeError by value with a fixed message, its source name and a line.
#pragma once

#include <cstdint>

#include "host/HostExport.h"

namespace Kv::Exception {

class HOST_API Base {
 public:
  Base(const char* message, const char* file, int32_t line) noexcept
      : message_(message), file_(file), line_(line) {}
  Base(const Base&) noexcept = default;
  Base& operator=(const Base&) noexcept = default;
  virtual ~Base();
  virtual const char* getTypeName() const noexcept;
  virtual const char* getMessage() const noexcept;
  virtual const char* getFile() const noexcept;
  virtual int32_t getLine() const noexcept;

 private:
  const char* message_;
  const char* file_;
  int32_t line_;
};

class HOST_API RuntimeError : public Base {
 public:
  using Base::Base;
  const char* getTypeName() const noexcept override;
};

class HOST_API LogicError : public Base {
 public:
  using Base::Base;
  const char* getTypeName() const noexcept override;
};

}  // namespace Kv::Exception
