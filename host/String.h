// Narrow text (String) and the wide display text (WString), both stored on
// the host heap.
//
// String converts from wide text by narrowing each code unit above 0x7F to
// '?', which is enough for the identifiers and keys the library builds.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "host/HostExport.h"
#include "host/OS.h"

using WString = std::basic_string<wchar_t, std::char_traits<wchar_t>, StdAllocator<wchar_t>>;
using NarrowString = std::basic_string<char, std::char_traits<char>, StdAllocator<char>>;

class HOST_API String {
 public:
  String() = default;
  String(const char* text);  // NOLINT(google-explicit-constructor): texts convert freely
  String(const char* text, std::size_t length);
  String(std::string_view text);  // NOLINT(google-explicit-constructor)
  String(const wchar_t* text);    // NOLINT(google-explicit-constructor)
  String(const WString& text);    // NOLINT(google-explicit-constructor)

  String& operator+=(const String& other);
  String& operator+=(const char* text);
  friend HOST_API String operator+(const String& a, const String& b);
  friend HOST_API String operator+(const String& a, const char* b);

  bool isEmpty() const noexcept { return text_.empty(); }
  std::size_t size() const noexcept { return text_.size(); }
  const char* c_str() const noexcept { return text_.c_str(); }
  operator const char*() const noexcept { return text_.c_str(); }  // NOLINT
  std::string_view view() const noexcept { return {text_.data(), text_.size()}; }

  // True when equal to text ignoring ASCII case.
  bool compareCaseInsensitive(const char* text) const noexcept;

  friend bool operator==(const String& a, const String& b) noexcept { return a.text_ == b.text_; }
  friend bool operator<(const String& a, const String& b) noexcept { return a.text_ < b.text_; }

 private:
  NarrowString text_;
};

namespace Kv {
HOST_API WString WStringFromAscii(const char* text);
HOST_API WString WStringFromInteger(int value);
}  // namespace Kv
