#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "host/StreamClassRegistry.h"
#include "host/Streamable.h"

namespace {

// A small Taggable with one layer of its own, "PR": a revision-1.0 count
// followed by that many 32-bit values.
class Probe : public Taggable {
 public:
  Probe() = default;
  explicit Probe(BuilderType t) : Taggable(t) {}
  std::vector<int> values;

  Taggable* clone() override { return new Probe(*this); }
  Streamable* clone(BuilderType t) override { return new Probe(t); }
  String hierarchyName(bool withRoot, bool shortNames) const override {
    String text = shortNames ? String("PR") : String("Probe");
    STRM_L_Taggable_buildHierarchyName(text, withRoot, shortNames);
    return text;
  }
  eStatus STRM_hierarchyPack(PStream& s) const override {
    PackList list;
    list.push_back({&packLayer, this});
    return Taggable::STRM_layerPack(this, s, &list);
  }
  eStatus STRM_hierarchyUnpack(PStream& s) override {
    const eStatus base = Taggable::STRM_layerUnpack(this, s);
    if (!StreamableTraitsBase::isOk(base)) return base;
    Layer layer(*this);
    return StreamableTraitsBase::unpackChunk(s, layer);
  }
  static Streamable* build(PStream& s) {
    std::unique_ptr<Probe> p(new Probe(eBuildForUnpack));
    return p->STRM_hierarchyUnpack(s) == StreamableTraitsBase::eFailed ? nullptr : p.release();
  }

 private:
  class Layer final : public StreamableTraitsBase::Layer {
   public:
    explicit Layer(const Probe& p) : p_(p) {}
    const char* shortLayerName() const override { return "PR"; }
    String layerName() const override { return "Probe"; }
    String objectName() const override { return p_.hierarchyName(false, false); }
    unsigned char revisionMajor() const override { return 1; }
    unsigned char revisionMinor() const override { return 0; }
    void packData(PStream& s) override {
      s.setUnsignedLong(static_cast<unsigned>(p_.values.size()));
      for (int v : p_.values) s.setLong(v);
    }
    void unpackData(PStream& s, unsigned char, unsigned char) override {
      auto& values = const_cast<Probe&>(p_).values;
      const unsigned n = s.getUnsignedLong();
      if (n > (s.layerDataEnd() - s.position()) / 4) {
        s.messageText().append("bad count");
        return;
      }
      values.resize(n);
      for (int& v : values) v = s.getLong();
    }

   private:
    const Probe& p_;
  };
  static eStatus packLayer(const Streamable* o, PStream& s, PackList* list) {
    Layer layer(*static_cast<const Probe*>(o));
    return StreamableTraitsBase::packChunk(s, layer, list);
  }
};

TEST(Streamable, LayersNestInsideTheirBases) {
  Probe p;
  p.tag(IdStamp(0x11, 0x22, 0x33));
  p.values = {5, -1};
  PStream s;
  ASSERT_EQ(p.STRM_hierarchyPack(s), StreamableTraitsBase::ePacked);
  const auto c = s.contents();
  const std::vector<unsigned char> expected = {
      1,    0, 0, 0, '$',  2,   0, 0, 0,    0,    0,    56,   0,  0, 0,     // root: own 0, total 56
      2,    0, 0, 0, 'T',  'G', 1, 0, 12,   0,    0,    0,    40, 0, 0, 0,  // TG: own 12, total 40
      0x11, 0, 0, 0, 0x22, 0,   0, 0, 0x33, 0,    0,    0,                  // the tag
      2,    0, 0, 0, 'P',  'R', 1, 0, 12,   0,    0,    0,    12, 0, 0, 0,  // PR: own 12, total 12
      2,    0, 0, 0, 5,    0,   0, 0, 0xFF, 0xFF, 0xFF, 0xFF,               // its data
  };
  EXPECT_EQ(std::vector<unsigned char>(c.begin(), c.end()), expected);

  s.position(0);
  Probe back(Streamable::eBuildForUnpack);
  EXPECT_FALSE(back.tag().valid());
  EXPECT_EQ(back.STRM_hierarchyUnpack(s), StreamableTraitsBase::eUnpacked);
  EXPECT_EQ(back.values, p.values);
  EXPECT_EQ(back.tag(), p.tag());
  EXPECT_TRUE(s.eof());
}

TEST(Streamable, AFailingLayerStopsThePackAndLeavesPlaceholders) {
  Probe p;
  PStream s;
  s.messageText().append("earlier trouble");
  EXPECT_EQ(p.STRM_hierarchyPack(s), StreamableTraitsBase::eFailed);  // all bytes written, but a message
  EXPECT_GT(s.size(), 0u);
}

TEST(Streamable, NamesAndTheirAdjustment) {
  Probe p;
  EXPECT_STREQ(p.hierarchyName(false, false).c_str(), "Taggable.Probe");
  EXPECT_STREQ(p.hierarchyName(true, true).c_str(), "$.TG.PR");
  EXPECT_STREQ(Taggable::subHierarchyName(false, true).c_str(), "TG");
  EXPECT_STREQ(Taggable::subHierarchyName(true, false).c_str(), "Streamable.Taggable");
  struct Row {
    const char* in;
    const char* out;
  };
  const Row rows[] = {{typeid(Probe).name(), "_anonymous_namespace___Probe"},
                      {typeid(std::string).name(), nullptr},
                      {"N3Aud14SimpleMixStateE", "Aud__SimpleMixState"},
                      {"class Aud::Thing", "Aud__Thing"},
                      {"struct X<int, 2>", "X_int__2_"},
                      {"", ""}};
  for (const Row& r : rows) {
    const String adjusted = Streamable::adjustName(r.in);
    if (r.out) {
      EXPECT_STREQ(adjusted.c_str(), r.out) << r.in;
    }
    EXPECT_EQ(std::string(adjusted.c_str())
                  .find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_"),
              std::string::npos)
        << r.in;
  }
  GrowString printed;
  p.printOn(printed);
  EXPECT_TRUE(printed == "Taggable.Probe");
  EXPECT_STREQ(p.asString().c_str(), "Taggable.Probe");
}

TEST(Streamable, RegistrarsComeAndGoWithTheirLifetime) {
  EXPECT_EQ(StreamClassRegistry::find("TG.PR"), nullptr);
  Probe p;
  p.values = {1, 2, 3};
  PStream s;
  {
    StreamClassRegistrar registrar("Taggable.Probe", "TG.PR", &Probe::build);
    EXPECT_EQ(StreamClassRegistry::find("TG.PR"), &Probe::build);
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
    EXPECT_EQ(static_cast<Probe&>(*back).values, p.values);
  }
  EXPECT_EQ(StreamClassRegistry::find("TG.PR"), nullptr);
  s.position(0);
  EXPECT_EQ(StreamClassRegistry::readObject(s), nullptr);
  EXPECT_STREQ(s.messageText().c_str(), "Unknown class 'TG.PR' in object stream.");
  PStream empty;
  EXPECT_EQ(StreamClassRegistry::readObject(empty), nullptr);
  EXPECT_FALSE(empty.messageText().isEmpty());
}

TEST(Taggable, CloneWithChildrenVisitsEachTagOnce) {
  Probe p;
  p.values = {4};
  TagMarkerTable table;
  std::vector<Taggable*> clones;
  p.cloneWithChildren(clones, table);
  p.cloneWithChildren(clones, table);
  ASSERT_EQ(clones.size(), 1u);
  std::unique_ptr<Taggable> owned(clones[0]);
  EXPECT_EQ(static_cast<Probe&>(*owned).values, p.values);
  EXPECT_TRUE(table.isMarked(p.tag()));
  TagMarkerTable destroyed;
  p.destroyChildren(destroyed);
  EXPECT_EQ(destroyed.size(), 1u);
  EXPECT_NE(Probe().tag(), p.tag());  // fresh tags
}

}  // namespace
