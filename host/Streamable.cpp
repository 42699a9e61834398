#include "host/Streamable.h"

#include <cxxabi.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

using eStatus = StreamableTraitsBase::eStatus;
using Layer = StreamableTraitsBase::Layer;

constexpr unsigned int kPlaceholder = 0xFFFFFFFFu;

void writeHeader(PStream& s, const char* name, unsigned char major, unsigned char minor, unsigned int ownSize,
                 unsigned int totalSize) {
  s.writeBinary(reinterpret_cast<const unsigned char*>(name), 0, false, false);
  s.setCookedChar(static_cast<char>(major));
  s.setCookedChar(static_cast<char>(minor));
  s.setUnsignedLong(ownSize);
  s.setUnsignedLong(totalSize);
}

// p + size, but never beyond the data.
unsigned int endWithin(const PStream& s, unsigned int p, unsigned int size) {
  const unsigned long long end = static_cast<unsigned long long>(p) + size;
  return static_cast<unsigned int>(std::min<unsigned long long>(end, s.size()));
}

}  // namespace

StreamableTraitsBase::Layer::~Layer() = default;

eStatus StreamableTraitsBase::packChunk(PStream& s, Layer& layer, PackList* list) {
  if (list && !list->empty()) list->pop_front();
  const char* name = layer.shortLayerName();
  const unsigned int start = s.position();
  writeHeader(s, name, layer.revisionMajor(), layer.revisionMinor(), kPlaceholder, kPlaceholder);
  const unsigned int dataStart = s.position();
  layer.packData(s);
  const unsigned int ownSize = s.position() - dataStart;
  if (list && !list->empty()) {
    const PackFunctionStackEntry next = list->front();
    const eStatus nested = next.function(next.object, s, list);
    if (!isOk(nested)) return nested;
  }
  const unsigned int end = s.position();
  s.position(start);
  writeHeader(s, name, layer.revisionMajor(), layer.revisionMinor(), ownSize, end - dataStart);
  s.position(end);
  return s.messageText().isEmpty() ? ePacked : eFailed;
}

eStatus StreamableTraitsBase::unpackChunk(PStream& s, Layer& layer) {
  int version = s.formatVersion();
  GrowString name;
  if (!s.eof()) s.readBinary(name, false);

  unsigned int major = 0, minor = 0;
  if (version == 1) {
    DynamicIntegralStorage<unsigned char, unsigned short> a, b;
    if (!s.eof()) s >> a;
    if (!s.eof()) s >> b;
    major = a.value;
    minor = b.value;
    if (major > 255 || minor > 255) {
      s.messageText()
          .append(major > 255 ? " Strm1.0 Object has oversized major rev ("
                              : " Strm1.0 Object has oversized minor rev (")
          .append(name)
          .append("). ");
      return eFailed;
    }
  } else if (version == 2) {
    if (!s.eof()) major = s.getUnsignedChar();
    if (!s.eof()) minor = s.getUnsignedChar();
  } else {
    s.messageText().append("Unrecognized version for Streamable base");
    return eFailed;
  }

  if (name == Streamable::shortLayerName() || name == "Streamable") {
    s.formatVersion(static_cast<int>(major));
    version = static_cast<int>(major);
  }

  unsigned int ownSize = kPlaceholder, totalSize = kPlaceholder;
  if (version == 1) {
    DynamicIntegralStorage<unsigned short, unsigned int> own(kPlaceholder), total(kPlaceholder);
    if (!s.eof()) s >> own;
    if (!s.eof()) s >> total;
    ownSize = own.value;
    totalSize = total.value;
  } else if (version == 2) {
    if (!s.eof()) ownSize = s.getUnsignedLong();
    if (!s.eof()) totalSize = s.getUnsignedLong();
  } else {
    s.messageText().append("Unrecognized version for Streamable base");
    return eFailed;
  }

  const unsigned int p = s.position();
  if (s.eof() && (ownSize != 0 || totalSize != 0)) {
    s.messageText()
        .append("Unexpected end-of-file while unpacking ")
        .append(layer.objectName())
        .append(", layer ")
        .append(layer.layerName())
        .append(".");
    return eUnexpectedEnd;
  }
  const unsigned int ownEnd = endWithin(s, p, ownSize);
  const unsigned int totalEnd = endWithin(s, p, totalSize);
  if (ownSize == 0) return eUnpacked;

  const unsigned long long shortfallBefore = s.shortfall();
  if (s.messageText().isEmpty() && !name.isEmpty()) {
    const String longName = layer.layerName();
    if (!(name == layer.shortLayerName()) && !(name == longName.c_str())) {
      s.messageText()
          .append("Expected short name '")
          .append(layer.shortLayerName())
          .append("' for layer ")
          .append(longName)
          .append(", got ")
          .append(name)
          .append(".");
      s.position(totalEnd);
      return eWrongLayer;
    }
    const unsigned int outerEnd = s.exchangeLayerDataEnd(ownEnd);
    layer.unpackData(s, static_cast<unsigned char>(major), static_cast<unsigned char>(minor));
    s.exchangeLayerDataEnd(outerEnd);
    if (!s.messageText().isEmpty()) {
      s.position(totalEnd);
      return eFailed;
    }
  }

  // Reads stop at the end of the data, so an over-read there shows only in
  // the shortfall.
  const unsigned int q = s.position();
  const unsigned long long overread = (q > ownEnd ? q - ownEnd : 0) + (s.shortfall() - shortfallBefore);
  if (overread > 0) {
    s.messageText().appendf(
        "Error: Unpacker read beyond end of chunk while unpacking object %s, layer %s v%d.%d, %d bytes "
        "overread.\n",
        layer.objectName().c_str(), layer.layerName().c_str(), static_cast<int>(major),
        static_cast<int>(minor), static_cast<int>(overread));
    return eFailed;
  }
  if (q < ownEnd) {
    std::printf(
        "Warning: Not all object data was read while unpacking object %s, layer %s v%d.%d, %d/%d bytes "
        "unread.\n",
        layer.objectName().c_str(), layer.layerName().c_str(), static_cast<int>(major),
        static_cast<int>(minor), static_cast<int>(ownEnd - q), static_cast<int>(ownSize));
  }
  s.position(ownEnd);
  return eUnpacked;
}

// --- TagMarkerTable ---

bool TagMarkerTable::mark(const IdStamp& tag) { return marked_.insert(tag).second; }

bool TagMarkerTable::isMarked(const IdStamp& tag) const { return marked_.count(tag) != 0; }

// --- Streamable ---

namespace {

// The root layer: no data, its major revision the stream format version.
class RootLayer final : public Layer {
 public:
  explicit RootLayer(const Streamable& object) : object_(object) {}
  const char* shortLayerName() const override { return Streamable::shortLayerName(); }
  String layerName() const override { return Streamable::layerName(); }
  String objectName() const override { return object_.hierarchyName(false, false); }
  unsigned char revisionMajor() const override { return 2; }
  unsigned char revisionMinor() const override { return 0; }
  void packData(PStream& s) override { s.formatVersion(2); }
  void unpackData(PStream&, unsigned char, unsigned char) override {}

 private:
  const Streamable& object_;
};

eStatus packRoot(const Streamable* object, PStream& s, StreamableTraitsBase::PackList* list) {
  RootLayer layer(*object);
  return StreamableTraitsBase::packChunk(s, layer, list);
}

}  // namespace

Streamable::~Streamable() = default;

eStatus Streamable::STRM_hierarchyUnpack(PStream& s) { return STRM_layerUnpack(this, s); }

eStatus Streamable::STRM_hierarchyPack(PStream& s) const {
  PackList list;
  return STRM_layerPack(this, s, &list);
}

void Streamable::printOn(GrowString& out) const { out.append(hierarchyName(false, false)); }

String Streamable::hierarchyName(bool withRoot, bool shortNames) const {
  String text;
  STRM_L_Streamable_buildHierarchyName(text, withRoot, shortNames);
  return text;
}

String Streamable::adjustName(const char* runtimeTypeName) {
  if (!runtimeTypeName) return String();
  int status = -1;
  char* demangled = abi::__cxa_demangle(runtimeTypeName, nullptr, nullptr, &status);
  std::string_view name = status == 0 && demangled ? demangled : runtimeTypeName;
  for (std::string_view prefix : {std::string_view("class "), std::string_view("struct ")}) {
    if (name.substr(0, prefix.size()) == prefix) name.remove_prefix(prefix.size());
  }
  NarrowString adjusted;
  for (std::size_t i = 0; i < name.size(); ++i) {
    const char c = name[i];
    if (c == ':' && i + 1 < name.size() && name[i + 1] == ':') {
      adjusted += "__";
      ++i;
    } else if ((c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_') {
      adjusted += c;
    } else {
      adjusted += '_';
    }
  }
  std::free(demangled);
  return String(std::string_view(adjusted.data(), adjusted.size()));
}

String Streamable::subHierarchyName(bool withRoot, bool shortNames) {
  if (!withRoot) return String();
  return shortNames ? String(shortLayerName()) : layerName();
}

eStatus Streamable::STRM_layerPack(const Streamable* object, PStream& s, PackList* list) const {
  list->push_front({&packRoot, object});
  return packRoot(object, s, list);
}

eStatus Streamable::STRM_layerUnpack(Streamable* object, PStream& s) {
  RootLayer layer(*object);
  return StreamableTraitsBase::unpackChunk(s, layer);
}

void Streamable::STRM_L_Streamable_buildHierarchyName(String& text, bool withRoot, bool shortNames) const {
  if (!withRoot) return;
  const String root = subHierarchyName(true, shortNames);
  text = text.isEmpty() ? root : root + "." + text;
}

// --- Taggable ---

namespace {

// Taggable's layer: the tag, three unsigned 32-bit words.
class TagLayer final : public Layer {
 public:
  TagLayer(const Taggable& object, Taggable* writable) : object_(object), writable_(writable) {}
  const char* shortLayerName() const override { return Taggable::shortLayerName(); }
  String layerName() const override { return Taggable::layerName(); }
  String objectName() const override { return object_.hierarchyName(false, false); }
  unsigned char revisionMajor() const override { return 1; }
  unsigned char revisionMinor() const override { return 0; }
  void packData(PStream& s) override {
    for (int i = 0; i < 3; ++i) s.setUnsignedLong(object_.tag().word(i));
  }
  void unpackData(PStream& s, unsigned char major, unsigned char) override {
    if (major != 1) {
      s.messageText().appendf("Encountered unknown version of Taggable (current v1.0, encountered v%d).",
                              major);
      return;
    }
    uint32_t w[3];
    for (uint32_t& word : w) word = s.getUnsignedLong();
    if (writable_) writable_->tag(IdStamp(w[0], w[1], w[2]));
  }

 private:
  const Taggable& object_;
  Taggable* writable_;
};

eStatus packTag(const Streamable* object, PStream& s, StreamableTraitsBase::PackList* list) {
  const auto* taggable = static_cast<const Taggable*>(object);
  TagLayer layer(*taggable, nullptr);
  return StreamableTraitsBase::packChunk(s, layer, list);
}

}  // namespace

Taggable::Taggable(BuilderType type) : Streamable(type), tag_(IdStamp::invalidStamp()) {}

Taggable::Taggable(BuilderType type, const Taggable& original) : Streamable(type), tag_(original.tag_) {}

Taggable::~Taggable() = default;

String Taggable::hierarchyName(bool withRoot, bool shortNames) const {
  String text;
  STRM_L_Taggable_buildHierarchyName(text, withRoot, shortNames);
  return text;
}

void Taggable::destroyChildren(TagMarkerTable& table) { table.mark(tag_); }
void Taggable::displaceNotify() {}
void Taggable::preDeleteNotify() {}
void Taggable::preDestroyNotify() {}
void Taggable::destroyNotify() {}

String Taggable::asString() const {
  GrowString text;
  printOn(text);
  return String(text.view());
}

void Taggable::cloneWithChildren(std::vector<Taggable*>& clones, TagMarkerTable& table) {
  if (table.mark(tag_)) clones.push_back(clone());
}

String Taggable::subHierarchyName(bool withRoot, bool shortNames) {
  const String base = Streamable::subHierarchyName(withRoot, shortNames);
  const String own = shortNames ? String(shortLayerName()) : layerName();
  return base.isEmpty() ? own : base + "." + own;
}

eStatus Taggable::STRM_hierarchyUnpack(PStream& s) { return STRM_layerUnpack(this, s); }

eStatus Taggable::STRM_hierarchyPack(PStream& s) const {
  PackList list;
  return STRM_layerPack(this, s, &list);
}

eStatus Taggable::STRM_layerPack(const Taggable* object, PStream& s, PackList* list) const {
  list->push_front({&packTag, object});
  return Streamable::STRM_layerPack(object, s, list);
}

eStatus Taggable::STRM_layerUnpack(Taggable* object, PStream& s) {
  const eStatus base = Streamable::STRM_layerUnpack(object, s);
  if (!StreamableTraitsBase::isOk(base)) return base;
  TagLayer layer(*object, object);
  return StreamableTraitsBase::unpackChunk(s, layer);
}

void Taggable::STRM_L_Taggable_buildHierarchyName(String& text, bool withRoot, bool shortNames) const {
  const String own = shortNames ? String(shortLayerName()) : layerName();
  text = text.isEmpty() ? own : own + "." + text;
  STRM_L_Streamable_buildHierarchyName(text, withRoot, shortNames);
}
