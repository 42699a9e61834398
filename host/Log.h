// Diagnostics. vel_splat reports a broken invariant: the report goes to the
// fatal-report handler (host::setFatalReportHandler) and then returns, so a
// caller continues safely with a neutral value. LogBoth writes a line to the
// log; tarn_printf prints to the console; both go to the log sink.
#pragma once

#include "host/HostExport.h"

HOST_API void vel_splat(const char* message);
HOST_API void LogBoth(const char* format, ...) __attribute__((format(printf, 1, 2)));
HOST_API void tarn_printf(const char* format, ...) __attribute__((format(printf, 1, 2)));
