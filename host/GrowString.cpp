#include "host/GrowString.h"

#include <cstdio>
#include <cstring>

GrowString::GrowString(const char* text) { append(text); }

GrowString::GrowString(const char* bytes, std::size_t length) { append(bytes, length); }

GrowString& GrowString::append(const char* text) {
  if (text) text_.append(text);
  return *this;
}

GrowString& GrowString::append(const char* bytes, std::size_t length) {
  if (bytes && length) text_.append(bytes, length);
  return *this;
}

GrowString& GrowString::append(char c) {
  text_.push_back(c);
  return *this;
}

GrowString& GrowString::append(const GrowString& other) {
  text_.append(other.text_);
  return *this;
}

GrowString& GrowString::append(const String& text) {
  const std::string_view v = text.view();
  text_.append(v.data(), v.size());
  return *this;
}

GrowString& GrowString::appendf(const char* format, ...) {
  va_list args;
  va_start(args, format);
  va_list copy;
  va_copy(copy, args);
  const int n = std::vsnprintf(nullptr, 0, format, copy);
  va_end(copy);
  if (n > 0) {
    const std::size_t old = text_.size();
    text_.resize(old + static_cast<std::size_t>(n));
    // vsnprintf writes the terminator into the string's own spare byte.
    std::vsnprintf(text_.data() + old, static_cast<std::size_t>(n) + 1, format, args);
  }
  va_end(args);
  return *this;
}

bool GrowString::operator==(const char* text) const noexcept {
  if (!text) return false;
  const std::size_t n = std::strlen(text);
  return n == text_.size() && std::memcmp(text_.data(), text, n) == 0;
}
