// GrowString: a growable run of bytes that reads as text. The object streams
// use it for the records they read back and for the message text a stream
// carries, so it holds any byte, embedded zeros included, and always keeps a
// terminating zero after its content for callers that want a C string.
#pragma once

#include <cstdarg>
#include <cstddef>
#include <string_view>

#include "host/HostExport.h"
#include "host/String.h"

class HOST_API GrowString {
 public:
  GrowString() = default;
  GrowString(const char* text);  // NOLINT(google-explicit-constructor): texts convert freely
  GrowString(const char* bytes, std::size_t length);

  GrowString& append(const char* text);
  GrowString& append(const char* bytes, std::size_t length);
  GrowString& append(char c);
  GrowString& append(const GrowString& other);
  GrowString& append(const String& text);
  // Appends printf-style formatted text.
  GrowString& appendf(const char* format, ...) __attribute__((format(printf, 2, 3)));

  void clear() noexcept { text_.clear(); }

  std::size_t length() const noexcept { return text_.size(); }
  bool isEmpty() const noexcept { return text_.empty(); }
  const char* c_str() const noexcept { return text_.c_str(); }
  operator const char*() const noexcept { return text_.c_str(); }  // NOLINT
  const unsigned char* bytes() const noexcept { return reinterpret_cast<const unsigned char*>(text_.data()); }
  std::string_view view() const noexcept { return {text_.data(), text_.size()}; }

  // True when the whole content equals text (so content with an embedded
  // zero never equals a C string).
  bool operator==(const char* text) const noexcept;
  bool operator==(const GrowString& other) const noexcept { return text_ == other.text_; }

 private:
  NarrowString text_;
};
