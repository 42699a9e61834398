#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "host/IniFile.h"

namespace {

// "attrib=value;" per pair, with a leading '!' on the pairs that are not valid.
std::string pairsOf(const KvIniFile& f, const char* section) {
  std::string out;
  for (const Kv::AttribValuePair& p : f[String(section)])
    out += std::string(p.valid() ? "" : "!") + p.attrib().c_str() + "=" + p.value().c_str() + ";";
  return out;
}

TEST(KvIniFile, ParsesSectionsPairsCommentsAndMalformedLines) {
  KvIniFile f;
  f.parse(
      "top=level\r\n; a comment\n\n[One]\n  a = 1  \r\nb=x=y\n# another comment\nno equals sign\n"
      "=empty attribute\n[ Two ]\nc=\n[unclosed\n[One]\nd=4");
  EXPECT_EQ(pairsOf(f, ""), "top=level;");
  EXPECT_EQ(pairsOf(f, "One"), "a=1;b=x=y;!no equals sign=;!=empty attribute=;d=4;");
  EXPECT_EQ(pairsOf(f, "Two"), "c=;![unclosed=;");
  EXPECT_EQ(pairsOf(f, "Missing"), "");
  EXPECT_FALSE(f.hasSection("Missing"));
  std::vector<std::string> names;
  for (const String& n : f.sectionNames()) names.push_back(n.c_str());
  EXPECT_EQ(names, (std::vector<std::string>{"", "One", "Two"}));
}

TEST(KvIniFile, PairsSayWhetherTheyCanBeWrittenBack) {
  const struct {
    const char *attrib, *value;
    bool valid;
  } rows[] = {{"key", "value", true},      {" key ", " v ", true}, {"", "v", false},   {"  ", "v", false},
              {"a=b", "v", false},         {"[x", "v", false},     {";x", "v", false}, {"#x", "v", false},
              {"k", "line\nbreak", false}, {"k\r", "v", false},    {"k", "", true}};
  for (const auto& r : rows) {
    Kv::AttribValuePair p{String(r.attrib), String(r.value)};
    EXPECT_EQ(p.valid(), r.valid) << r.attrib;
    if (!r.valid) continue;
    KvIniFile f, g;  // what is valid comes back unchanged through the text form
    f[String("S")].push_back(p);
    g.parse(f.text().c_str());
    EXPECT_EQ(pairsOf(g, "S"), std::string(p.attrib().c_str()) + "=" + p.value().c_str() + ";");
  }
  EXPECT_STREQ(Kv::AttribValuePair(String("k=v")).line().c_str(), "k=v");
  EXPECT_STREQ(Kv::AttribValuePair(String("junk")).line().c_str(), "junk");  // kept, though not valid
  EXPECT_FALSE(Kv::AttribValuePair().valid());
}

TEST(KvIniFile, SectionReferencesSurviveAddingSectionsAndTheTextHasValidPairsOnly) {
  KvIniFile f, w;
  KvIniFile::Pairs* first = &f[String("first")];
  for (int k = 0; k < 100; ++k) f[String(std::to_string(k).c_str())];
  first->emplace_back(String("a=1"));
  EXPECT_EQ(pairsOf(f, "first"), "a=1;");
  w[String("B")].emplace_back(String("x=1"));
  w[String("B")].emplace_back(String("malformed"));
  w[String("")].emplace_back(String("g=0"));  // made later, written first: it has no header
  w[String("Bad]Name")].emplace_back(String("y=2"));
  w[String("C")];
  EXPECT_EQ(std::string(w.text().c_str()), "g=0\n\n[B]\nx=1\n\n[C]\n");
}

TEST(KvIniFile, SavesAtomicallyAndLoadsBack) {
  namespace fs = std::filesystem;
  const fs::path dir = fs::path(testing::TempDir()) / "kvini_test_dir";
  fs::remove_all(dir);
  fs::create_directories(dir);
  const std::string path = (dir / "config.ini").string();
  std::ofstream(path) << "[Old]\nk=v\n";
  KvIniFile f, g, h;
  f[String("New")].emplace_back(String("k=2"));
  ASSERT_TRUE(f.save(path.c_str()));
  // Only the file itself is left: the temporary was renamed over it.
  std::vector<std::string> entries;
  for (const auto& e : fs::directory_iterator(dir)) entries.push_back(e.path().filename().string());
  EXPECT_EQ(entries, std::vector<std::string>{"config.ini"});
  ASSERT_TRUE(g.load(path.c_str()));
  EXPECT_EQ(std::string(g.text().c_str()), "[New]\nk=2\n");  // nothing of the old file
  // A save that cannot happen fails; a missing file loads nothing.
  EXPECT_FALSE(f.save((dir / "missing" / "x.ini").string().c_str()));
  EXPECT_FALSE(f.save(""));
  EXPECT_FALSE(h.load((dir / "missing.ini").string().c_str()));
  EXPECT_TRUE(h.sectionNames().empty());
  fs::remove_all(dir);
}

}  // namespace
