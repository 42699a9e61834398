#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <typeinfo>
#include <utility>
#include <vector>

#include "host/StreamClassRegistry.h"
#include "host/Streamable.h"

namespace {

// A Taggable with one layer of its own, "PR": one 32-bit value.
class Probe : public Taggable, StreamableTraitsBase::Layer {
 public:
  Probe() = default;
  explicit Probe(BuilderType t) : Taggable(t) {}
  int value = 0;

  Taggable* clone() override { return new Probe(*this); }
  Streamable* clone(BuilderType t) override { return new Probe(t); }
  String hierarchyName(bool withRoot, bool shortNames) const override {
    String text = shortNames ? String("PR") : String("Probe");
    STRM_L_Taggable_buildHierarchyName(text, withRoot, shortNames);
    return text;
  }
  eStatus STRM_hierarchyPack(PStream& s) const override {
    PackList list{{&packLayer, this}};
    return Taggable::STRM_layerPack(this, s, &list);
  }
  eStatus STRM_hierarchyUnpack(PStream& s) override {
    const eStatus base = Taggable::STRM_layerUnpack(this, s);
    return StreamableTraitsBase::isOk(base) ? StreamableTraitsBase::unpackChunk(s, *this) : base;
  }
  static Streamable* build(PStream& s) {
    std::unique_ptr<Probe> p(new Probe(eBuildForUnpack));
    return p->STRM_hierarchyUnpack(s) == StreamableTraitsBase::eFailed ? nullptr : p.release();
  }

 private:
  const char* shortLayerName() const override { return "PR"; }
  String layerName() const override { return "Probe"; }
  String objectName() const override { return hierarchyName(false, false); }
  unsigned char revisionMajor() const override { return 1; }
  unsigned char revisionMinor() const override { return 0; }
  void packData(PStream& s) override { s.setLong(value); }
  void unpackData(PStream& s, unsigned char, unsigned char) override { value = s.getLong(); }
  static eStatus packLayer(const Streamable* o, PStream& s, PackList* list) {
    return StreamableTraitsBase::packChunk(s, const_cast<Probe&>(static_cast<const Probe&>(*o)), list);
  }
};

TEST(Streamable, LayersNestInsideTheirBases) {
  Probe p;
  p.tag(IdStamp(0x11, 0x22, 0x33));
  p.value = -2;
  PStream s;
  ASSERT_EQ(p.STRM_hierarchyPack(s), StreamableTraitsBase::ePacked);
  const auto c = s.contents();
  const std::vector<unsigned char> expected = {
      1,    0,    0,    0,    '$',  2,   0, 0, 0,    0, 0, 48, 0,  0, 0,     // root: own 0, total 48
      2,    0,    0,    0,    'T',  'G', 1, 0, 12,   0, 0, 0,  32, 0, 0, 0,  // TG: own 12, total 32
      0x11, 0,    0,    0,    0x22, 0,   0, 0, 0x33, 0, 0, 0,                // the tag
      2,    0,    0,    0,    'P',  'R', 1, 0, 4,    0, 0, 0,  4,  0, 0, 0,  // PR: own 4, total 4
      0xFE, 0xFF, 0xFF, 0xFF,                                                // its data
  };
  EXPECT_EQ(std::vector<unsigned char>(c.begin(), c.end()), expected);
  s.position(0);
  Probe back(Streamable::eBuildForUnpack);
  EXPECT_EQ(back.STRM_hierarchyUnpack(s), StreamableTraitsBase::eUnpacked);
  EXPECT_EQ(back.value, -2);
  EXPECT_EQ(back.tag(), p.tag());
  EXPECT_TRUE(s.eof());

  PStream troubled;  // a message already in the stream fails the pack, though every byte is written
  troubled.messageText().append("earlier trouble");
  EXPECT_EQ(p.STRM_hierarchyPack(troubled), StreamableTraitsBase::eFailed);
  EXPECT_EQ(troubled.size(), expected.size());
}

TEST(Streamable, NamesTheirAdjustmentAndClonesPerTag) {
  Probe p;
  EXPECT_STREQ(p.hierarchyName(true, true).c_str(), "$.TG.PR");
  EXPECT_STREQ(Taggable::subHierarchyName(true, false).c_str(), "Streamable.Taggable");
  EXPECT_STREQ(p.asString().c_str(), "Taggable.Probe");  // through printOn
  // Adjusted names hold only name characters; nullptr: whatever the exact text.
  const char* rows[][2] = {{typeid(Probe).name(), "_anonymous_namespace___Probe"},
                           {typeid(std::string).name(), nullptr},
                           {"N3Aud14SimpleMixStateE", "Aud__SimpleMixState"},
                           {"class Aud::Thing", "Aud__Thing"},
                           {"struct X<int, 2>", "X_int__2_"},
                           {"", ""}};
  for (const auto& [in, out] : rows) {
    const std::string adjusted = Streamable::adjustName(in).c_str();
    EXPECT_EQ(adjusted, out ? out : adjusted) << in;
    const char* nameChars = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_";
    EXPECT_EQ(adjusted.find_first_not_of(nameChars), std::string::npos) << in;
  }

  p.value = 4;  // a clone per tag, however often it is reached
  TagMarkerTable table, destroyed;
  std::vector<Taggable*> clones;
  p.cloneWithChildren(clones, table);
  p.cloneWithChildren(clones, table);
  ASSERT_EQ(clones.size(), 1u);
  std::unique_ptr<Taggable> owned(clones[0]);
  EXPECT_EQ(static_cast<Probe&>(*owned).value, 4);
  EXPECT_EQ(owned->tag(), p.tag());
  EXPECT_TRUE(table.isMarked(p.tag()));
  p.destroyChildren(destroyed);
  EXPECT_EQ(destroyed.size(), 1u);
}

TEST(Streamable, RegistrarsComeAndGoWithTheirLifetime) {
  Probe p;
  p.value = 123;
  PStream s;
  {
    StreamClassRegistrar registrar("Taggable.Probe", "TG.PR", &Probe::build);
    EXPECT_EQ(StreamClassRegistry::find("Taggable.Probe"), &Probe::build);
    {
      // A later registrar shadows, then uncovers, the earlier one.
      StreamClassRegistrar shadow("Taggable.Probe", "TG.PR", nullptr);
      EXPECT_EQ(StreamClassRegistry::find("TG.PR"), nullptr);
    }
    EXPECT_EQ(StreamClassRegistry::find("TG.PR"), &Probe::build);
    EXPECT_EQ(StreamClassRegistry::writeObject(s, p), StreamableTraitsBase::ePacked);
    s.position(0);
    std::unique_ptr<Streamable> back = StreamClassRegistry::readObject(s);
    ASSERT_NE(back, nullptr);
    EXPECT_EQ(static_cast<Probe&>(*back).value, 123);
  }
  EXPECT_EQ(StreamClassRegistry::find("TG.PR"), nullptr);
  s.position(0);
  EXPECT_EQ(StreamClassRegistry::readObject(s), nullptr);
  EXPECT_STREQ(s.messageText().c_str(), "Unknown class 'TG.PR' in object stream.");
  PStream empty;
  EXPECT_EQ(StreamClassRegistry::readObject(empty), nullptr);
  EXPECT_FALSE(empty.messageText().isEmpty());
}

}  // namespace
