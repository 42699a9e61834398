#include "host/StreamClassRegistry.h"

#include <map>
#include <mutex>
#include <vector>

namespace {

struct Registry : host::HostAllocated {
  using Key = NarrowString;
  using Registrars = std::vector<const StreamClassRegistrar*, StdAllocator<const StreamClassRegistrar*>>;
  std::mutex mutex;
  std::map<Key, Registrars, std::less<Key>, StdAllocator<std::pair<const Key, Registrars>>> byName;

  void add(const String& name, const StreamClassRegistrar* r) {
    if (name.isEmpty()) return;
    byName[Key(name.c_str())].push_back(r);
  }
  void remove(const String& name, const StreamClassRegistrar* r) {
    auto found = byName.find(Key(name.c_str()));
    if (found == byName.end()) return;
    Registrars& list = found->second;
    for (auto it = list.begin(); it != list.end(); ++it) {
      if (*it == r) {
        list.erase(it);
        break;
      }
    }
    if (list.empty()) byName.erase(found);
  }
};

// Never destroyed: registrars of libraries unloaded during static
// destruction still unregister from it.
Registry& registry() {
  static Registry* const r = new Registry();
  return *r;
}

}  // namespace

StreamClassRegistrar::StreamClassRegistrar(const String& hierarchyName, const String& shortHierarchyName,
                                           Builder build)
    : name_(hierarchyName), shortName_(shortHierarchyName), builder_(build) {
  Registry& r = registry();
  std::lock_guard lock(r.mutex);
  r.add(name_, this);
  if (!(shortName_ == name_)) r.add(shortName_, this);
}

StreamClassRegistrar::~StreamClassRegistrar() {
  Registry& r = registry();
  std::lock_guard lock(r.mutex);
  r.remove(name_, this);
  if (!(shortName_ == name_)) r.remove(shortName_, this);
}

StreamClassRegistrar::Builder StreamClassRegistry::find(const char* hierarchyName) {
  if (!hierarchyName) return nullptr;
  Registry& r = registry();
  std::lock_guard lock(r.mutex);
  auto found = r.byName.find(Registry::Key(hierarchyName));
  return found == r.byName.end() ? nullptr : found->second.back()->builder();
}

StreamableTraitsBase::eStatus StreamClassRegistry::writeObject(PStream& s, const Streamable& object) {
  const String name = object.hierarchyName(false, true);
  s.writeBinary(reinterpret_cast<const unsigned char*>(name.c_str()), static_cast<unsigned int>(name.size()),
                false, false);
  return object.STRM_hierarchyPack(s);
}

std::unique_ptr<Streamable> StreamClassRegistry::readObject(PStream& s) {
  GrowString name;
  if (!s.readBinary(name, false)) {
    s.messageText().append("Unexpected end-of-file while reading an object's class name.");
    return nullptr;
  }
  const StreamClassRegistrar::Builder builder = find(name.c_str());
  if (!builder) {
    s.messageText().append("Unknown class '").append(name.c_str()).append("' in object stream.");
    return nullptr;
  }
  std::unique_ptr<Streamable> object(builder(s));
  if (!object && s.messageText().isEmpty()) {
    s.messageText().append("Could not build an object of class '").append(name.c_str()).append("'.");
  }
  return object;
}
