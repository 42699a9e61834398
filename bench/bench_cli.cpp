// The tonebits tool against sox, whole processes on the same 60 s, 48 kHz,
// stereo, 24-bit file, measured in the same run (wall time; sox must be on
// the PATH). The ratio counters give sox's time over the tool's.
#include <benchmark/benchmark.h>
#include <spawn.h>
#include <sys/wait.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

extern char** environ;

namespace {

const std::string kDir = "/tmp/tonebits-bench-cli";

int runQuiet(std::vector<std::string> args) {
  std::vector<char*> argv;
  for (auto& a : args) argv.push_back(a.data());
  argv.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", 1, 0);
  posix_spawn_file_actions_addopen(&actions, 2, "/dev/null", 1, 0);
  pid_t pid;
  int status = -1;
  if (posix_spawnp(&pid, argv[0], &actions, nullptr, argv.data(), environ) == 0) waitpid(pid, &status, 0);
  posix_spawn_file_actions_destroy(&actions);
  return status;
}

double seconds(const std::vector<std::string>& args) {
  const auto start = std::chrono::steady_clock::now();
  if (runQuiet(args) != 0) return -1.0;
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

void prepare() {
  static bool done = false;
  if (done) return;
  runQuiet({"mkdir", "-p", kDir});
  // The demo's programme, 60 s long, is the test file.
  runQuiet({TONEBITS_TOOL, "demo", "--dir", kDir, "--seconds", "60", "--quiet"});
  done = true;
}

// Alternates the two commands and reports each one's best time.
void compare(benchmark::State& state, const std::vector<std::string>& tool,
             const std::vector<std::string>& sox) {
  prepare();
  double bestTool = 1e9, bestSox = 1e9;
  for (auto _ : state) {
    const double t = seconds(tool), s = seconds(sox);
    if (t < 0 || s < 0) {
      state.SkipWithError("a command failed (is sox installed?)");
      return;
    }
    bestTool = std::min(bestTool, t);
    bestSox = std::min(bestSox, s);
    state.SetIterationTime(t);
  }
  state.counters["tonebits_ms"] = bestTool * 1e3;
  state.counters["sox_ms"] = bestSox * 1e3;
  state.counters["sox_over_tonebits"] = bestSox / bestTool;
}

void ProcessGainAndThreeBandEq(benchmark::State& state) {
  const std::string in = kDir + "/demo.wav";
  compare(state,
          {TONEBITS_TOOL, "process", in, kDir + "/tb.wav", "--quiet", "--eq", "peak:100:1q:3", "--eq",
           "peak:1000:1q:-6", "--eq", "peak:8000:1q:4", "--gain", "-3"},
          {"sox", in, kDir + "/sox.wav", "equalizer", "100", "1q", "+3", "equalizer", "1000", "1q", "-6",
           "equalizer", "8000", "1q", "+4", "gain", "-3"});
}

void MeterAgainstSoxStat(benchmark::State& state) {
  const std::string in = kDir + "/demo.wav";
  compare(state, {TONEBITS_TOOL, "meter", in}, {"sox", in, "-n", "stat"});
}

BENCHMARK(ProcessGainAndThreeBandEq)->UseManualTime()->Iterations(15)->Unit(benchmark::kMillisecond);
BENCHMARK(MeterAgainstSoxStat)->UseManualTime()->Iterations(15)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
