#include "host/Resources.h"

#include <cwctype>
#include <map>
#include <mutex>

#include "host/HostHooks.h"

namespace {

struct ResourceTable {
  std::mutex mutex;
  std::map<int, WString> overrides;
};

ResourceTable& table() {
  static ResourceTable* const t = new ResourceTable();
  return *t;
}

const wchar_t* builtInText(int id) {
  switch (id) {
    case 56: return L"Invalid";
    case 74: return L"kHz";
    case 2075: return L"Analogue";
    case 2078: return L"AES/EBU";
    case 2079: return L"S/PDIF";
    case 2080: return L"ADAT";
    case 2081: return L"SDI";
    case 2082: return L"Project";
    case 2450: return L"Same source and timecode";
    case 2451: return L"Same source";
    case 2452: return L"Always";
    default: return nullptr;
  }
}

}  // namespace

WString resourceStrW(int id, ResStrFmt format) {
  WString text;
  {
    ResourceTable& t = table();
    std::lock_guard lock(t.mutex);
    auto found = t.overrides.find(id);
    if (found != t.overrides.end()) {
      text = found->second;
    } else if (const wchar_t* builtIn = builtInText(id)) {
      text = builtIn;
    } else {
      text = L"#" + Kv::WStringFromInteger(id);
    }
  }
  if (format == ResStrFmt_Upper) {
    for (wchar_t& c : text) c = static_cast<wchar_t>(std::towupper(static_cast<wint_t>(c)));
  } else if (format == ResStrFmt_Lower) {
    for (wchar_t& c : text) c = static_cast<wchar_t>(std::towlower(static_cast<wint_t>(c)));
  }
  return text;
}

WString resourceStrW(int id, int format) {
  return resourceStrW(id, format == 1 ? ResStrFmt_Upper : format == 2 ? ResStrFmt_Lower : ResStrFmt_Plain);
}

WString paddedResourceStrW(int id, const WString& before, const WString& after) {
  return before + resourceStrW(id, ResStrFmt_Plain) + after;
}

namespace host {
void setResourceText(int id, std::wstring_view text) {
  ResourceTable& t = table();
  std::lock_guard lock(t.mutex);
  t.overrides[id] = WString(text.data(), text.size());
}
}  // namespace host
