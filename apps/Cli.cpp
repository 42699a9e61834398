#include "Cli.h"

#include <unistd.h>

#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>

namespace cli {

Args::Args(int argc, char** argv, int first, const std::vector<std::string>& valueOptions,
           const std::vector<std::string>& flags) {
  auto contains = [](const std::vector<std::string>& v, const std::string& s) {
    for (const auto& x : v)
      if (x == s) return true;
    return false;
  };
  bool onlyPositional = false;
  for (int i = first; i < argc; ++i) {
    std::string word = argv[i];
    if (onlyPositional || word.size() < 2 || word.compare(0, 2, "--") != 0) {
      positional_.push_back(word);
      continue;
    }
    if (word == "--") {
      onlyPositional = true;
      continue;
    }
    std::string name = word.substr(2), value;
    const auto eq = name.find('=');
    const bool inlineValue = eq != std::string::npos;
    if (inlineValue) {
      value = name.substr(eq + 1);
      name.resize(eq);
    }
    if (contains(valueOptions, name)) {
      if (!inlineValue) {
        if (i + 1 >= argc) throw UsageError("option --" + name + " needs a value");
        value = argv[++i];
      }
      options_.emplace_back(name, value);
    } else if (contains(flags, name)) {
      if (inlineValue) throw UsageError("option --" + name + " takes no value");
      options_.emplace_back(name, "");
    } else {
      throw UsageError("unknown option --" + name);
    }
  }
}

bool Args::has(const std::string& name) const {
  for (const auto& [n, v] : options_)
    if (n == name) return true;
  return false;
}

std::string Args::value(const std::string& name, const std::string& fallback) const {
  std::string found = fallback;
  for (const auto& [n, v] : options_)
    if (n == name) found = v;  // the last one wins
  return found;
}

std::vector<std::string> Args::values(const std::string& name) const {
  std::vector<std::string> found;
  for (const auto& [n, v] : options_)
    if (n == name) found.push_back(v);
  return found;
}

double parseNumber(const std::string& text, const std::string& what) {
  char* end = nullptr;
  const double v = std::strtod(text.c_str(), &end);
  if (text.empty() || end != text.c_str() + text.size() || !std::isfinite(v))
    throw UsageError("bad " + what + ": '" + text + "'");
  return v;
}

double parseNumber(const std::string& text, const std::string& what, double lo, double hi) {
  const double v = parseNumber(text, what);
  if (v < lo || v > hi)
    throw UsageError(what + " " + text + " is outside " + std::to_string(lo) + " to " + std::to_string(hi));
  return v;
}

double nowSeconds() {
  using namespace std::chrono;
  return duration<double>(steady_clock::now().time_since_epoch()).count();
}

std::string formatDb(double linear) {
  if (!(linear > 0.0)) return "-inf";
  char text[32];
  std::snprintf(text, sizeof text, "%.2f", 20.0 * std::log10(linear));
  return text;
}

Progress::Progress(std::string label, uint64_t total, bool quiet)
    : label_(std::move(label)), total_(total), enabled_(!quiet && isatty(2)), start_(nowSeconds()) {}

Progress::~Progress() { finish(); }

void Progress::update(uint64_t done) {
  if (!enabled_ || total_ == 0) return;
  if (!shown_ && nowSeconds() - start_ < 1.0) return;
  const int percent = static_cast<int>(done * 100 / total_);
  if (percent == lastPercent_) return;
  lastPercent_ = percent;
  shown_ = true;
  const int width = 30, filled = percent * width / 100;
  std::fprintf(stderr, "\r%s [%.*s%*s] %3d%%", label_.c_str(), filled,
               "==============================", width - filled, "", percent);
  std::fflush(stderr);
}

void Progress::finish() {
  if (shown_) std::fputs("\n", stderr);
  shown_ = false;
  enabled_ = false;
}

}  // namespace cli
