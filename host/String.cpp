#include "host/String.h"

#include <cstring>

String::String(const char* text) {
  if (text) text_.assign(text);
}
String::String(const char* text, std::size_t length) {
  if (text) text_.assign(text, length);
}
String::String(std::string_view text) : text_(text.data(), text.size()) {}

String::String(const wchar_t* text) {
  if (!text) return;
  for (; *text; ++text) text_.push_back(*text >= 0 && *text < 0x80 ? char(*text) : '?');
}

String::String(const WString& text) {
  text_.reserve(text.size());
  for (wchar_t c : text) text_.push_back(c >= 0 && c < 0x80 ? char(c) : '?');
}

String& String::operator+=(const String& other) {
  text_ += other.text_;
  return *this;
}
String& String::operator+=(const char* text) {
  if (text) text_ += text;
  return *this;
}
String operator+(const String& a, const String& b) {
  String joined(a);
  joined += b;
  return joined;
}
String operator+(const String& a, const char* b) {
  String joined(a);
  joined += b;
  return joined;
}

bool String::compareCaseInsensitive(const char* text) const noexcept {
  if (!text) return false;
  const std::size_t n = std::strlen(text);
  if (n != text_.size()) return false;
  for (std::size_t i = 0; i < n; ++i) {
    auto lower = [](unsigned char c) { return (c >= 'A' && c <= 'Z') ? c + 32 : c; };
    if (lower(static_cast<unsigned char>(text_[i])) != lower(static_cast<unsigned char>(text[i])))
      return false;
  }
  return true;
}

namespace Kv {

WString WStringFromAscii(const char* text) {
  WString wide;
  if (!text) return wide;
  for (; *text; ++text) wide.push_back(static_cast<wchar_t>(static_cast<unsigned char>(*text)));
  return wide;
}

WString WStringFromInteger(int value) {
  // Digits of the magnitude as unsigned, so INT_MIN has its own digits.
  unsigned long long magnitude = value < 0
                                     ? 0ull - static_cast<unsigned long long>(static_cast<long long>(value))
                                     : static_cast<unsigned long long>(value);
  wchar_t digits[24];
  int n = 0;
  do {
    digits[n++] = static_cast<wchar_t>(L'0' + magnitude % 10);
    magnitude /= 10;
  } while (magnitude);
  WString text;
  if (value < 0) text.push_back(L'-');
  while (n) text.push_back(digits[--n]);
  return text;
}

}  // namespace Kv
