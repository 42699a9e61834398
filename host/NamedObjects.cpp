#include "host/NamedObjects.h"

#include <atomic>
#include <map>
#include <mutex>
#include <string>
#include <typeindex>
#include <utility>

#include "host/HostHooks.h"

namespace {

struct Registry {
  std::recursive_mutex mutex;  // a creation function may ask for another object
  std::map<std::pair<std::type_index, std::string>, iObject*> objects;
  std::atomic<bool> available{true};
};

Registry& registry() {
  static Registry* const r = new Registry();
  return *r;
}

}  // namespace

namespace Kv {

NamedObjectsNamespace& NamedObjectsNamespace::getGlobalNamespaceInstance() {
  static NamedObjectsNamespace instance;
  return instance;
}

iObject* NamedObjectsNamespace::findOrCreate_(const std::type_info& type, const char* name, CreateFn create) {
  Registry& r = registry();
  if (!r.available.load() || !name) return nullptr;
  std::lock_guard lock(r.mutex);
  auto key = std::make_pair(std::type_index(type), std::string(name));
  auto found = r.objects.find(key);
  if (found != r.objects.end()) return found->second;
  iObject* made = create ? create() : nullptr;
  if (made) r.objects.emplace(std::move(key), made);  // kept for the life of the process
  return made;
}

}  // namespace Kv

namespace host {
void setNamedObjectsAvailable(bool available) { registry().available.store(available); }
}  // namespace host
