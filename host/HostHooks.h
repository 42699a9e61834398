// Embedder hooks: an application routes the host services to its own
// framework; tests observe and control the host through them. Each setter is
// thread-safe; an empty function restores the default.
#pragma once

#include <functional>
#include <string_view>

#include "host/HostExport.h"

namespace host {

// Receives every vel_splat report. Default: the message goes to the log sink.
HOST_API void setFatalReportHandler(std::function<void(const char* message)> handler);
// Receives what LogBoth and tarn_printf print. Default: standard error.
HOST_API void setLogSink(std::function<void(const char* text)> sink);
// The source of service_get_msecs_precise. Default: a monotonic clock in ms.
HOST_API void setClock(std::function<double()> clock);
// What config_int reads.
HOST_API void setConfigInt(const char* key, int value);
HOST_API void clearConfig();
// Empties the preference store.
HOST_API void resetPreferences();
// What Kv::CurrentProject::getFrameDuration returns (default 1/25).
HOST_API void setFrameDuration(double seconds);
// Overrides one resource text.
HOST_API void setResourceText(int id, std::wstring_view text);
// Makes findOrCreate_ of the global named-object namespace fail (return
// null) or work again, to exercise callers' handling of a missing object.
HOST_API void setNamedObjectsAvailable(bool available);

}  // namespace host
