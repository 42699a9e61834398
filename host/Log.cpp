#include "host/Log.h"

#include <cstdarg>
#include <cstdio>
#include <functional>
#include <mutex>
#include <string>

#include "host/HostHooks.h"

namespace {

struct LogHooks {
  std::mutex mutex;
  std::function<void(const char*)> fatal;
  std::function<void(const char*)> sink;
};

LogHooks& hooks() {
  static LogHooks* const h = new LogHooks();
  return *h;
}

void toSink(const char* text) {
  std::function<void(const char*)> sink;
  {
    std::lock_guard lock(hooks().mutex);
    sink = hooks().sink;
  }
  if (sink) {
    sink(text);
  } else {
    std::fputs(text, stderr);
  }
}

std::string format(const char* fmt, va_list args) {
  va_list copy;
  va_copy(copy, args);
  const int n = std::vsnprintf(nullptr, 0, fmt, copy);
  va_end(copy);
  if (n <= 0) return {};
  std::string text(static_cast<std::size_t>(n), '\0');
  std::vsnprintf(text.data(), text.size() + 1, fmt, args);
  return text;
}

}  // namespace

void vel_splat(const char* message) {
  std::function<void(const char*)> fatal;
  {
    std::lock_guard lock(hooks().mutex);
    fatal = hooks().fatal;
  }
  if (!message) message = "";
  if (fatal) {
    fatal(message);
  } else {
    toSink(("fatal: " + std::string(message) + "\n").c_str());
  }
}

void LogBoth(const char* fmt, ...) {
  va_list args;
  va_start(args, fmt);
  std::string text = format(fmt, args);
  va_end(args);
  if (text.empty() || text.back() != '\n') text += '\n';
  toSink(text.c_str());
}

void tarn_printf(const char* fmt, ...) {
  va_list args;
  va_start(args, fmt);
  const std::string text = format(fmt, args);
  va_end(args);
  toSink(text.c_str());
}

namespace host {
void setFatalReportHandler(std::function<void(const char*)> handler) {
  std::lock_guard lock(hooks().mutex);
  hooks().fatal = std::move(handler);
}
void setLogSink(std::function<void(const char*)> sink) {
  std::lock_guard lock(hooks().mutex);
  hooks().sink = std::move(sink);
}
}  // namespace host
