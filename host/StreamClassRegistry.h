// The class registry of the object streams: classes register a builder under
// their hierarchy names (long and short) so that an object written to a
// stream can be read back without the reader knowing its class.
//
// A StreamClassRegistrar registers for as long as it lives; a class keeps
// one as a static member, so it registers when its library loads and
// unregisters when it unloads. Registration is thread-safe; a later
// registrar of a name shadows an earlier one until it goes away.
//
// An object record is the object's short hierarchy name as a text record
// followed by the object's layers (STRM_hierarchyPack).
#pragma once

#include <memory>

#include "host/HostExport.h"
#include "host/ObjectStream.h"
#include "host/Streamable.h"
#include "host/String.h"

class HOST_API StreamClassRegistrar {
 public:
  // Makes an object and unpacks it from the stream; null when it failed.
  using Builder = Streamable* (*)(PStream& s);

  StreamClassRegistrar(const String& hierarchyName, const String& shortHierarchyName, Builder build);
  ~StreamClassRegistrar();
  StreamClassRegistrar(const StreamClassRegistrar&) = delete;
  StreamClassRegistrar& operator=(const StreamClassRegistrar&) = delete;

  const String& hierarchyName() const noexcept { return name_; }
  const String& shortHierarchyName() const noexcept { return shortName_; }
  Builder builder() const noexcept { return builder_; }

 private:
  String name_;
  String shortName_;
  Builder builder_;
};

class HOST_API StreamClassRegistry {
 public:
  // The builder registered under a long or short hierarchy name, or null.
  static StreamClassRegistrar::Builder find(const char* hierarchyName);
  static bool isRegistered(const char* hierarchyName) { return find(hierarchyName) != nullptr; }

  // Writes an object record; the result of the object's pack.
  static StreamableTraitsBase::eStatus writeObject(PStream& s, const Streamable& object);
  // Reads an object record through the builder registered for its name.
  // Null, with a message in the stream's message text, when the record is
  // cut short, names no registered class, or its builder fails.
  static std::unique_ptr<Streamable> readObject(PStream& s);
};
