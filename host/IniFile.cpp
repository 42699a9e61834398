#include "host/IniFile.h"

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#if defined(__unix__) || defined(__APPLE__)
#include <unistd.h>
#define TONEBITS_HOST_HAVE_FSYNC 1
#endif

namespace {

std::string_view trim(std::string_view s) {
  while (!s.empty() && (s.front() == ' ' || s.front() == '\t')) s.remove_prefix(1);
  while (!s.empty() && (s.back() == ' ' || s.back() == '\t')) s.remove_suffix(1);
  return s;
}

bool hasLineBreak(std::string_view s) {
  for (char c : s) {
    if (c == '\n' || c == '\r') return true;
  }
  return false;
}

}  // namespace

namespace Kv {

AttribValuePair::AttribValuePair(const String& line) {
  const std::string_view text = line.view();
  const std::size_t eq = text.find('=');
  if (eq == std::string_view::npos) {
    attrib_ = line;
    return;
  }
  const std::string_view attribute = trim(text.substr(0, eq));
  const std::string_view value = trim(text.substr(eq + 1));
  if (attribute.empty() || hasLineBreak(attribute) || hasLineBreak(value)) {
    attrib_ = line;
    return;
  }
  attrib_ = String(attribute);
  value_ = String(value);
  valid_ = true;
}

AttribValuePair::AttribValuePair(const String& attribute, const String& value) {
  const std::string_view a = trim(attribute.view());
  const std::string_view v = trim(value.view());
  attrib_ = String(a);
  value_ = String(v);
  valid_ = !a.empty() && a.front() != '[' && a.front() != ';' && a.front() != '#' &&
           a.find('=') == std::string_view::npos && !hasLineBreak(a) && !hasLineBreak(v);
}

String AttribValuePair::line() const { return valid_ ? attrib_ + "=" + value_ : attrib_; }

}  // namespace Kv

KvIniFile::KvIniFile() = default;
KvIniFile::~KvIniFile() = default;
KvIniFile::KvIniFile(const KvIniFile&) = default;
KvIniFile& KvIniFile::operator=(const KvIniFile&) = default;

KvIniFile::Pairs& KvIniFile::operator[](const String& section) {
  const std::string_view key = section.view();
  auto found = index_.find(key);
  if (found != index_.end()) return sections_[found->second].pairs;
  sections_.push_back(Section{section, Pairs()});
  index_.emplace(NarrowString(key.data(), key.size()), sections_.size() - 1);
  return sections_.back().pairs;
}

const KvIniFile::Pairs& KvIniFile::operator[](const String& section) const {
  static const Pairs empty;
  auto found = index_.find(section.view());
  return found == index_.end() ? empty : sections_[found->second].pairs;
}

bool KvIniFile::hasSection(const String& section) const {
  return index_.find(section.view()) != index_.end();
}

std::vector<String, StdAllocator<String>> KvIniFile::sectionNames() const {
  std::vector<String, StdAllocator<String>> names;
  names.reserve(sections_.size());
  for (const Section& s : sections_) names.push_back(s.name);
  return names;
}

void KvIniFile::clear() {
  sections_.clear();
  index_.clear();
}

void KvIniFile::parse(std::string_view text) {
  clear();
  Pairs* current = nullptr;
  while (!text.empty()) {
    const std::size_t nl = text.find('\n');
    std::string_view line = text.substr(0, nl);
    text.remove_prefix(nl == std::string_view::npos ? text.size() : nl + 1);
    if (!line.empty() && line.back() == '\r') line.remove_suffix(1);
    const std::string_view content = trim(line);
    if (content.empty() || content.front() == ';' || content.front() == '#') continue;
    if (content.front() == '[') {
      const std::size_t close = content.find(']');
      if (close != std::string_view::npos) {
        current = &(*this)[String(trim(content.substr(1, close - 1)))];
        continue;
      }
    }
    if (!current) current = &(*this)[String("")];
    current->emplace_back(String(line));
  }
}

NarrowString KvIniFile::text() const {
  NarrowString out;
  auto writePairs = [&out](const Pairs& pairs) {
    for (const Kv::AttribValuePair& pair : pairs) {
      if (!pair.valid()) continue;
      out.append(pair.attrib().view().data(), pair.attrib().size());
      out += '=';
      out.append(pair.value().view().data(), pair.value().size());
      out += '\n';
    }
  };
  // The unnamed section has no header, so it can only come first.
  auto unnamed = index_.find(std::string_view());
  if (unnamed != index_.end()) writePairs(sections_[unnamed->second].pairs);
  for (const Section& s : sections_) {
    const std::string_view name = s.name.view();
    if (name.empty() || name.find(']') != std::string_view::npos || hasLineBreak(name)) continue;
    if (!out.empty()) out += '\n';
    out += '[';
    out.append(name.data(), name.size());
    out += "]\n";
    writePairs(s.pairs);
  }
  return out;
}

bool KvIniFile::load(const char* path) {
  clear();
  std::FILE* file = path ? std::fopen(path, "rb") : nullptr;
  if (!file) return false;
  NarrowString content;
  char buffer[4096];
  std::size_t n;
  while ((n = std::fread(buffer, 1, sizeof buffer, file)) > 0) content.append(buffer, n);
  const bool ok = !std::ferror(file);
  std::fclose(file);
  if (!ok) return false;
  parse(std::string_view(content.data(), content.size()));
  return true;
}

bool KvIniFile::save(const char* path) const {
  if (!path || !*path) return false;
  const NarrowString content = text();

  // A name of its own for each save in flight, beside the target so that the
  // rename stays within one file system.
  static std::atomic<unsigned> counter{0};
  char suffix[48];
#ifdef TONEBITS_HOST_HAVE_FSYNC
  const long process = static_cast<long>(::getpid());
#else
  const long process = 0;
#endif
  std::snprintf(suffix, sizeof suffix, ".tmp.%ld.%u", process, counter.fetch_add(1) + 1);
  NarrowString temporary(path);
  temporary += suffix;

  std::FILE* file = std::fopen(temporary.c_str(), "wb");
  if (!file) return false;
  bool ok = std::fwrite(content.data(), 1, content.size(), file) == content.size();
  ok = std::fflush(file) == 0 && ok;
#ifdef TONEBITS_HOST_HAVE_FSYNC
  ok = ::fsync(::fileno(file)) == 0 && ok;
#endif
  ok = std::fclose(file) == 0 && ok;
  if (ok) ok = std::rename(temporary.c_str(), path) == 0;
  if (!ok) std::remove(temporary.c_str());
  return ok;
}
