// INI-style configuration files: named sections, each an ordered list of
// attribute-value pairs.
//
// Text form, as load and parse read it:
//   [Section name]        starts a section; later lines belong to it
//   attribute=value       a pair; split at the first '=', spaces and tabs
//                         around the attribute and the value dropped
//   ; comment, # comment  ignored, as are blank lines
// Lines before the first section header belong to the section named "".
// A section that appears twice is one section, its pairs in file order.
// Any other line (no '=', an empty attribute, an unclosed "[") is kept in its
// section as a pair that is not valid, so a reader sees that something was
// there and skips it. Line ends may be "\n" or "\r\n".
//
// save writes the sections in the order they were first made, each as its
// header followed by its valid pairs, and replaces the file atomically: it
// writes a temporary file beside it, flushes it to the disk and renames it
// over the old one, so a crash leaves either the old file or the new one.
// Pairs that are not valid, and sections whose names cannot be written
// (holding ']' or a line break), are not saved.
//
// Section names and attributes are matched exactly (case matters); readers
// that want otherwise compare attributes themselves.
#pragma once

#include <cstddef>
#include <deque>
#include <map>
#include <string_view>
#include <vector>

#include "host/HostExport.h"
#include "host/OS.h"
#include "host/String.h"

namespace Kv {

class HOST_API AttribValuePair {
 public:
  // Not valid.
  AttribValuePair() = default;
  // From "attribute=value": valid when there is an '=' and the attribute,
  // spaces dropped, is not empty and holds no line break.
  explicit AttribValuePair(const String& line);
  // Valid when the attribute, spaces dropped, is not empty, neither starts
  // with '[', ';' or '#' nor holds '=', and neither text holds a line
  // break: exactly the pairs that save and load give back unchanged.
  AttribValuePair(const String& attribute, const String& value);

  const String& attrib() const noexcept { return attrib_; }
  const String& value() const noexcept { return value_; }
  bool valid() const noexcept { return valid_; }
  // "attribute=value"; for a pair that is not valid, the text it was made of.
  String line() const;

 private:
  String attrib_;
  String value_;
  bool valid_ = false;
};

}  // namespace Kv

class HOST_API KvIniFile {
 public:
  using Pairs = std::vector<Kv::AttribValuePair, StdAllocator<Kv::AttribValuePair>>;

  KvIniFile();
  ~KvIniFile();
  KvIniFile(const KvIniFile&);
  KvIniFile& operator=(const KvIniFile&);

  // The section's pairs, made empty when there is no such section yet. The
  // reference stays good while other sections are added.
  Pairs& operator[](const String& section);
  // The section's pairs; an empty list when there is no such section.
  const Pairs& operator[](const String& section) const;
  bool hasSection(const String& section) const;
  // Section names in the order they were first made.
  std::vector<String, StdAllocator<String>> sectionNames() const;
  void clear();

  // Replaces the content by what text holds.
  void parse(std::string_view text);
  // The text form save writes.
  NarrowString text() const;

  // Replaces the content by the file's; false (content empty) when it
  // cannot be read.
  bool load(const char* path);
  // Writes the text form to path atomically; false, the old file untouched,
  // when it cannot.
  bool save(const char* path) const;

 private:
  struct Section {
    String name;
    Pairs pairs;
  };
  // A deque, so that adding a section never moves the others: a reference
  // to a section's pairs stays good until clear, parse or load.
  using Sections = std::deque<Section, StdAllocator<Section>>;
  using Index = std::map<NarrowString, std::size_t, std::less<>,
                         StdAllocator<std::pair<const NarrowString, std::size_t>>>;

  Sections sections_;
  Index index_;
};
