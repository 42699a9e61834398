#include "host/Config.h"

#include <map>
#include <mutex>
#include <string>
#include <variant>

#include "host/HostHooks.h"

namespace {

struct Store {
  std::mutex mutex;
  std::map<std::string, int> config;
  std::map<std::string, std::variant<int, double, bool>> preferences;
};

Store& store() {
  static Store* const s = new Store();
  return *s;
}

// A stored value of another type than asked for reads as the default: the
// key's type is part of its meaning.
template <class T>
T get(const String& key, T defaultValue) {
  Store& s = store();
  std::lock_guard lock(s.mutex);
  auto found = s.preferences.find(std::string(key.view()));
  if (found == s.preferences.end()) return defaultValue;
  if (const T* value = std::get_if<T>(&found->second)) return *value;
  return defaultValue;
}

template <class T>
void set(const String& key, T value) {
  Store& s = store();
  std::lock_guard lock(s.mutex);
  s.preferences[std::string(key.view())] = value;
}

}  // namespace

int config_int(const char* key, int defaultValue) {
  if (!key) return defaultValue;
  Store& s = store();
  std::lock_guard lock(s.mutex);
  auto found = s.config.find(key);
  return found == s.config.end() ? defaultValue : found->second;
}

int EditorPreferences::getPreference(const String& key, int defaultValue) const {
  return get(key, defaultValue);
}
double EditorPreferences::getPreference(const String& key, double defaultValue) const {
  return get(key, defaultValue);
}
bool EditorPreferences::getPreference(const String& key, bool defaultValue) const {
  return get(key, defaultValue);
}
void EditorPreferences::setPreference(const String& key, int value) { set(key, value); }
void EditorPreferences::setPreference(const String& key, double value) { set(key, value); }
void EditorPreferences::setPreference(const String& key, bool value) { set(key, value); }

EditorPreferences& prefs() {
  static EditorPreferences preferences;
  return preferences;
}

namespace host {
void setConfigInt(const char* key, int value) {
  if (!key) return;
  Store& s = store();
  std::lock_guard lock(s.mutex);
  s.config[key] = value;
}
void clearConfig() {
  Store& s = store();
  std::lock_guard lock(s.mutex);
  s.config.clear();
}
void resetPreferences() {
  Store& s = store();
  std::lock_guard lock(s.mutex);
  s.preferences.clear();
}
}  // namespace host
