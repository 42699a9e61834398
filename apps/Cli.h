// Shared pieces of the tonebits command-line tool: argument parsing, errors
// with exit codes, and the progress bar.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

namespace cli {

// Exit codes: 0 success, 1 bad usage or option value, 2 input/output error,
// 3 not a WAVE file, 4 unsupported coding, 5 truncated data.
enum ExitCode { kOk = 0, kUsage = 1, kIo = 2, kNotWave = 3, kUnsupported = 4, kTruncated = 5 };

class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// A parsed command line: positional words and --name[=value] options.
class Args {
 public:
  // valueOptions lists the options that take a value (given as --name VALUE
  // or --name=VALUE); every other --name is a flag. Unknown options throw.
  Args(int argc, char** argv, int first, const std::vector<std::string>& valueOptions,
       const std::vector<std::string>& flags);

  bool has(const std::string& name) const;
  std::string value(const std::string& name, const std::string& fallback = {}) const;
  std::vector<std::string> values(const std::string& name) const;  // every occurrence
  const std::vector<std::string>& positional() const { return positional_; }

 private:
  std::vector<std::pair<std::string, std::string>> options_;
  std::vector<std::string> positional_;
};

double parseNumber(const std::string& text, const std::string& what);
double parseNumber(const std::string& text, const std::string& what, double lo, double hi);

// A progress bar on standard error, shown only when standard error is a
// terminal, the work has lasted about a second, and quiet is off.
class Progress {
 public:
  Progress(std::string label, uint64_t total, bool quiet);
  ~Progress();
  void update(uint64_t done);
  void finish();

 private:
  std::string label_;
  uint64_t total_;
  bool enabled_;
  bool shown_ = false;
  double start_;
  int lastPercent_ = -1;
};

double nowSeconds();
std::string formatDb(double linear);

}  // namespace cli
