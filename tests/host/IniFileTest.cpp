#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "host/IniFile.h"

namespace {

struct Pair {
  std::string attrib, value;
  bool valid;
  bool operator==(const Pair& o) const { return attrib == o.attrib && value == o.value && valid == o.valid; }
};
std::ostream& operator<<(std::ostream& os, const Pair& p) {
  return os << "{" << p.attrib << "|" << p.value << "|" << p.valid << "}";
}

std::vector<Pair> pairsOf(const KvIniFile& f, const char* section) {
  std::vector<Pair> out;
  for (const Kv::AttribValuePair& p : f[String(section)])
    out.push_back({p.attrib().c_str(), p.value().c_str(), p.valid()});
  return out;
}

TEST(KvIniFile, ParsesSectionsPairsCommentsAndMalformedLines) {
  KvIniFile f;
  f.parse(
      "top=level\r\n"
      "; a comment\n"
      "\n"
      "[One]\n"
      "  a = 1  \r\n"
      "b=x=y\n"
      "# another comment\n"
      "no equals sign\n"
      "=empty attribute\n"
      "[ Two ]\n"
      "c=\n"
      "[unclosed\n"
      "[One]\n"
      "d=4");
  using P = std::vector<Pair>;
  EXPECT_EQ(pairsOf(f, ""), (P{{"top", "level", true}}));
  EXPECT_EQ(pairsOf(f, "One"), (P{{"a", "1", true},
                                  {"b", "x=y", true},
                                  {"no equals sign", "", false},
                                  {"=empty attribute", "", false},
                                  {"d", "4", true}}));
  EXPECT_EQ(pairsOf(f, "Two"), (P{{"c", "", true}, {"[unclosed", "", false}}));
  EXPECT_TRUE(pairsOf(f, "Missing").empty());
  EXPECT_FALSE(f.hasSection("Missing"));
  const auto names = f.sectionNames();
  ASSERT_EQ(names.size(), 3u);
  EXPECT_STREQ(names[0].c_str(), "");
  EXPECT_STREQ(names[1].c_str(), "One");
  EXPECT_STREQ(names[2].c_str(), "Two");
}

TEST(KvIniFile, PairsSayWhetherTheyCanBeWrittenBack) {
  struct Row {
    const char* attrib;
    const char* value;
    bool valid;
  };
  const Row rows[] = {{"key", "value", true}, {" key ", " v ", true}, {"", "v", false},
                      {"  ", "v", false},     {"a=b", "v", false},    {"[x", "v", false},
                      {";x", "v", false},     {"#x", "v", false},     {"k", "line\nbreak", false},
                      {"k\r", "v", false},    {"k", "", true}};
  for (const Row& r : rows) {
    Kv::AttribValuePair p{String(r.attrib), String(r.value)};
    EXPECT_EQ(p.valid(), r.valid) << r.attrib;
    if (!r.valid) continue;
    // What is valid comes back unchanged through the text form.
    KvIniFile f;
    f[String("S")].push_back(p);
    KvIniFile g;
    g.parse(f.text().c_str());
    ASSERT_EQ(g[String("S")].size(), 1u) << r.attrib;
    EXPECT_EQ(g[String("S")][0].attrib(), p.attrib());
    EXPECT_EQ(g[String("S")][0].value(), p.value());
  }
  Kv::AttribValuePair fromLine(String("k=v"));
  EXPECT_STREQ(fromLine.line().c_str(), "k=v");
  Kv::AttribValuePair bad(String("junk"));
  EXPECT_FALSE(bad.valid());
  EXPECT_STREQ(bad.line().c_str(), "junk");
  EXPECT_FALSE(Kv::AttribValuePair().valid());
}

TEST(KvIniFile, SectionReferencesSurviveAddingSections) {
  KvIniFile f;
  KvIniFile::Pairs* first = &f[String("first")];
  std::vector<KvIniFile::Pairs*> more;
  for (int k = 0; k < 100; ++k) more.push_back(&f[String(std::to_string(k).c_str())]);
  first->emplace_back(String("a=1"));
  more[3]->emplace_back(String("b=2"));
  EXPECT_EQ(f[String("first")].size(), 1u);
  EXPECT_EQ(f[String("3")].size(), 1u);
}

TEST(KvIniFile, WritesHeadersAndValidPairsOnly) {
  KvIniFile f;
  f[String("B")].emplace_back(String("x=1"));
  f[String("B")].emplace_back(String("malformed"));
  f[String("")].emplace_back(String("g=0"));  // made later, written first: it has no header
  f[String("Bad]Name")].emplace_back(String("y=2"));
  f[String("C")];
  EXPECT_EQ(std::string(f.text().c_str()), "g=0\n\n[B]\nx=1\n\n[C]\n");
}

TEST(KvIniFile, SavesAtomicallyAndLoadsBack) {
  namespace fs = std::filesystem;
  const fs::path dir = fs::path(testing::TempDir()) / "kvini_test_dir";
  fs::remove_all(dir);
  fs::create_directories(dir);
  const std::string path = (dir / "config.ini").string();
  {
    std::ofstream old(path);
    old << "[Old]\nk=v\n";
  }
  KvIniFile f;
  f[String("New")].emplace_back(String("k=2"));
  ASSERT_TRUE(f.save(path.c_str()));
  // Only the file itself is left: the temporary was renamed over it.
  std::vector<std::string> entries;
  for (const auto& e : fs::directory_iterator(dir)) entries.push_back(e.path().filename().string());
  EXPECT_EQ(entries, std::vector<std::string>{"config.ini"});
  KvIniFile g;
  ASSERT_TRUE(g.load(path.c_str()));
  EXPECT_FALSE(g.hasSection("Old"));
  ASSERT_EQ(g[String("New")].size(), 1u);
  EXPECT_STREQ(g[String("New")][0].value().c_str(), "2");

  // A save that cannot happen leaves no file behind and the old one intact.
  EXPECT_FALSE(f.save((dir / "missing" / "x.ini").string().c_str()));
  EXPECT_FALSE(f.save(""));
  KvIniFile h;
  EXPECT_FALSE(h.load((dir / "missing.ini").string().c_str()));
  EXPECT_TRUE(h.sectionNames().empty());
  fs::remove_all(dir);
}

}  // namespace
