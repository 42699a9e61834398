// The subcommands of the tonebits tool. Each takes the whole command line
// and the index of its first argument, and returns the process exit code.
#pragma once

namespace cli {

int runDemo(int argc, char** argv, int first);
int runInfo(int argc, char** argv, int first);
int runMeter(int argc, char** argv, int first);
int runConvert(int argc, char** argv, int first);
int runProcess(int argc, char** argv, int first);
int runMix(int argc, char** argv, int first);
int runPlot(int argc, char** argv, int first);

}  // namespace cli
