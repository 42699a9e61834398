// Process-wide named objects: one object per type and name, made on first
// request by the caller's creation function and kept until the process ends.
#pragma once

#include <typeinfo>

#include "host/HostExport.h"
#include "host/Ptr.h"

namespace Kv {

class HOST_API NamedObjectsNamespace {
 public:
  static NamedObjectsNamespace& getGlobalNamespaceInstance();

  using CreateFn = iObject* (*)();
  // The one object of this type and name, made by create on the first
  // request; null when the namespace is unavailable or create gives null.
  // Thread-safe: create runs at most once per type and name.
  iObject* findOrCreate_(const std::type_info& type, const char* name, CreateFn create);

  template <class T>
  T* findOrCreate(const char* name) {
    return static_cast<T*>(findOrCreate_(typeid(T), name, []() -> iObject* { return new T(); }));
  }

 private:
  NamedObjectsNamespace() = default;
};

}  // namespace Kv
