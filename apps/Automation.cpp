#include "Automation.h"

#include <cmath>
#include <fstream>
#include <sstream>

#include "Cli.h"
#include "WaveFile.h"

namespace cli {

std::unique_ptr<Aud::DynamicLevelControl::Store> readAutomation(const std::string& path) {
  std::ifstream in(path);
  if (!in) throw WaveError(WaveError::Io, "'" + path + "': cannot read the automation file");
  auto store = std::make_unique<Aud::DynamicLevelControl::Store>();
  std::string line;
  for (int number = 1; std::getline(in, line); ++number) {
    const auto first = line.find_first_not_of(" \t\r");
    if (first == std::string::npos || line[first] == '#') continue;
    std::istringstream words(line);
    std::string timeText, levelText, extra;
    words >> timeText >> levelText;
    const std::string where = path + ":" + std::to_string(number);
    if (levelText.empty() || (words >> extra)) throw UsageError(where + ": expected TIME LEVEL");
    const double time = parseNumber(timeText, where + ": time", 0.0, 1e7);
    double level;
    if (levelText.size() > 2 && (levelText.compare(levelText.size() - 2, 2, "dB") == 0 ||
                                 levelText.compare(levelText.size() - 2, 2, "db") == 0)) {
      level = std::pow(
          10.0, parseNumber(levelText.substr(0, levelText.size() - 2), where + ": level", -200, 40) / 20.0);
    } else {
      level = parseNumber(levelText, where + ": level", 0.0, 100.0);
    }
    store->insert(Aud::DynamicLevelControl::Store::Node(time, static_cast<float>(level)));
  }
  if (store->empty()) throw UsageError("'" + path + "' holds no automation nodes");
  return store;
}

}  // namespace cli
