// A small SVG line-chart writer for the plot and demo pictures.
#pragma once

#include <string>
#include <vector>

namespace cli {

struct Series {
  std::string label;
  std::string colour;
  std::vector<std::pair<double, double>> points;  // x, y in data units
};

struct Chart {
  std::string title, xLabel, yLabel;
  bool logX = false;
  double xMin = 0, xMax = 1, yMin = 0, yMax = 1;
  std::vector<double> xTicks, yTicks;
  std::vector<Series> series;
};

// The chart as an SVG document.
std::string renderSvg(const Chart& chart);
// Writes text to path through a temporary file renamed into place.
void writeTextFile(const std::string& path, const std::string& text);

}  // namespace cli
