// Streamable objects: the layered chunk format every object stream uses.
//
// An object is written layer by layer, base class first. Each layer is one
// chunk:
//   short name   text record (writeBinary(name, 0, false, false))
//   major, minor revision of the layer data, one char each
//   own size     unsigned 32-bit: bytes of this layer's data
//   total size   unsigned 32-bit: own size plus the chunks of the layers
//                nested after it (the derived classes' layers)
//   layer data, then the nested chunks
// Both sizes count from the byte after the total size. Version-1 streams,
// read only, store the revisions as DynamicIntegralStorage<unsigned char,
// unsigned short> and the sizes as DynamicIntegralStorage<unsigned short,
// unsigned int>.
//
// The root layer, Streamable's own, is a chunk named "$" (long name
// "Streamable") with no data whose major revision is the stream format
// version; reading a header named "$" or "Streamable" sets the stream's
// format version to its major revision. Taggable's layer, "TG" ("Taggable"),
// holds the object's tag, three unsigned 32-bit words.
//
// StreamableTraitsBase::packChunk and unpackChunk are the shared frame of one
// layer: a class describes its layer through a StreamableTraitsBase::Layer
// and lets the frame write the header, its data and the nested layers, or
// read the header back and check it. Results are StreamableTraitsBase::
// eStatus: 2 packed, 3 unpacked (also: nothing to read), 6 failed with a
// message in the stream's message text, 7 the chunk belongs to another layer
// (skipped), 8 the data ended right after a header that announced data.
// After 2 or 3 a caller goes on to the next layer.
//
// Packing goes down a list of pack functions: the most derived class puts
// its layer's function at the front and calls its base class's layer pack,
// which does the same, until Streamable writes the root chunk; each chunk,
// once its own data is written, calls the list's front entry for the layer
// nested in it.
#pragma once

#include <cstdint>
#include <list>
#include <set>
#include <vector>

#include "host/GrowString.h"
#include "host/HostExport.h"
#include "host/IdStamp.h"
#include "host/OS.h"
#include "host/ObjectStream.h"
#include "host/String.h"

class Streamable;

struct HOST_API StreamableTraitsBase {
  enum eStatus : int32_t {
    ePacked = 2,
    eUnpacked = 3,
    eFailed = 6,
    eWrongLayer = 7,
    eUnexpectedEnd = 8,
  };
  // True for the two results after which a caller goes on to the next layer.
  static bool isOk(eStatus status) noexcept { return status == ePacked || status == eUnpacked; }

  struct PackFunctionStackEntry;
  using PackList = std::list<PackFunctionStackEntry, StdAllocator<PackFunctionStackEntry>>;
  using PackFunction = eStatus (*)(const Streamable* object, PStream& s, PackList* list);
  struct PackFunctionStackEntry {
    PackFunction function;
    const Streamable* object;
  };

  // One layer of one object, as the frame sees it.
  class HOST_API Layer {
   public:
    virtual ~Layer();
    virtual const char* shortLayerName() const = 0;
    virtual String layerName() const = 0;
    // The object's hierarchyName(false, false), for messages.
    virtual String objectName() const = 0;
    // The revision the header carries when packing.
    virtual unsigned char revisionMajor() const = 0;
    virtual unsigned char revisionMinor() const = 0;
    // Writes the layer data; may change the revision, which the frame
    // writes into the header afterwards.
    virtual void packData(PStream& s) = 0;
    // Takes the revision read and reads the layer data. Complaints go to the
    // stream's message text; s.layerDataEnd() is the end of the own data.
    virtual void unpackData(PStream& s, unsigned char major, unsigned char minor) = 0;
  };

  // Writes layer's chunk at the position: drops the list's front entry (the
  // one that called), writes the header with placeholder sizes, the data,
  // the nested layers through the list's new front entry, and then the
  // header again with the real sizes. A nested layer's failure is returned
  // as it is, leaving the placeholders. 6 when the stream carries a message
  // at the end, else 2.
  static eStatus packChunk(PStream& s, Layer& layer, PackList* list);
  // Reads layer's chunk at the position. Sizes that point beyond the data
  // end at the end of the data. On 3 the position is at the end of the own
  // data (where a nested chunk begins); on 7, and on 6 from the layer data,
  // at the end of the whole chunk.
  static eStatus unpackChunk(PStream& s, Layer& layer);
};

// A set of tags, marked once each, for walks over object graphs in which an
// object may be reached twice.
class HOST_API TagMarkerTable {
 public:
  // True when tag was not marked yet (and is now).
  bool mark(const IdStamp& tag);
  bool isMarked(const IdStamp& tag) const;
  std::size_t size() const noexcept { return marked_.size(); }
  void clear() noexcept { marked_.clear(); }

 private:
  std::set<IdStamp, std::less<IdStamp>, StdAllocator<IdStamp>> marked_;
};

// An object that can be written to and read from an object stream. Lives on
// the host heap.
class HOST_API Streamable : public host::HostAllocated {
 public:
  using eStatus = StreamableTraitsBase::eStatus;
  using PackList = StreamableTraitsBase::PackList;
  // Why a builder or a clone makes an object: to unpack into it, or to copy.
  enum BuilderType : int32_t { eBuildForUnpack = 1, eBuildForClone = 2 };

  // Virtual operations, in slot order.
  virtual eStatus STRM_hierarchyUnpack(PStream& s);
  virtual eStatus STRM_hierarchyPack(PStream& s) const;
  virtual ~Streamable();
  // Appends a one-line description (the hierarchy name by default).
  virtual void printOn(GrowString& out) const;
  // The names of the object's layers from the base down, joined with ".";
  // withRoot puts the root layer's name in front; shortNames uses the short
  // layer names.
  virtual String hierarchyName(bool withRoot, bool shortNames) const;
  virtual Streamable* clone(BuilderType type) = 0;

  // A run-time type name made into a layer name: demangled, without a
  // "class " or "struct " prefix, each "::" turned into "__" and any other
  // character that is not a letter, digit or '_' into '_'. So a layer name
  // never holds the "." that joins hierarchy names.
  static String adjustName(const char* runtimeTypeName);

  static const char* shortLayerName() noexcept { return "$"; }
  static String layerName() { return "Streamable"; }
  // The root's name when withRoot, else empty.
  static String subHierarchyName(bool withRoot, bool shortNames);

 protected:
  Streamable() = default;
  explicit Streamable(BuilderType) {}
  Streamable(const Streamable&) = default;
  Streamable& operator=(const Streamable&) = default;

  eStatus STRM_layerPack(const Streamable* object, PStream& s, PackList* list) const;
  eStatus STRM_layerUnpack(Streamable* object, PStream& s);
  void STRM_L_Streamable_buildHierarchyName(String& text, bool withRoot, bool shortNames) const;
};

// A Streamable with an identity, the tag, and the lifecycle notifications an
// owner sends before it displaces, deletes or destroys it. A default-made
// object has a fresh tag; a copy has its original's tag.
class HOST_API Taggable : public Streamable {
 public:
  using Streamable::clone;

  ~Taggable() override;
  String hierarchyName(bool withRoot, bool shortNames) const override;

  // Virtual operations added here, in slot order. The notifications do
  // nothing by default; destroyChildren marks this object's tag.
  virtual void destroyChildren(TagMarkerTable& table);
  virtual void displaceNotify();
  virtual void preDeleteNotify();
  virtual void preDestroyNotify();
  virtual void destroyNotify();
  // What printOn writes, as a String.
  virtual String asString() const;
  virtual Taggable* clone() = 0;
  // Appends a clone of this object when its tag is not marked yet, and marks
  // it; the caller owns what is appended.
  virtual void cloneWithChildren(std::vector<Taggable*>& clones, TagMarkerTable& table);

  const IdStamp& tag() const noexcept { return tag_; }
  void tag(const IdStamp& t) noexcept { tag_ = t; }

  static const char* shortLayerName() noexcept { return "TG"; }
  static String layerName() { return "Taggable"; }
  static String subHierarchyName(bool withRoot, bool shortNames);

  eStatus STRM_hierarchyUnpack(PStream& s) override;
  eStatus STRM_hierarchyPack(PStream& s) const override;

 protected:
  Taggable() = default;
  Taggable(const Taggable&) = default;
  Taggable& operator=(const Taggable&) = default;
  // For unpacking: the invalid tag until the layer is read.
  explicit Taggable(BuilderType type);
  // For cloning: the original's tag.
  Taggable(BuilderType type, const Taggable& original);

  eStatus STRM_layerPack(const Taggable* object, PStream& s, PackList* list) const;
  eStatus STRM_layerUnpack(Taggable* object, PStream& s);
  void STRM_L_Taggable_buildHierarchyName(String& text, bool withRoot, bool shortNames) const;

 private:
  IdStamp tag_;
};
