// Configuration keys (read-only to the library) and the editor preference
// store. Both are in memory and thread-safe; host::setConfigInt and
// host::resetPreferences control them.
#pragma once

#include "host/HostExport.h"
#include "host/String.h"

// The integer configured under key, or defaultValue.
HOST_API int config_int(const char* key, int defaultValue);

class HOST_API EditorPreferences {
 public:
  int getPreference(const String& key, int defaultValue) const;
  double getPreference(const String& key, double defaultValue) const;
  bool getPreference(const String& key, bool defaultValue) const;
  void setPreference(const String& key, int value);
  void setPreference(const String& key, double value);
  void setPreference(const String& key, bool value);
};

HOST_API EditorPreferences& prefs();
