#include "Svg.h"

#include <unistd.h>

#include <cmath>
#include <cstdio>
#include <sstream>

#include "WaveFile.h"

namespace cli {

namespace {

std::string escape(const std::string& s) {
  std::string out;
  for (char c : s) {
    switch (c) {
      case '<': out += "&lt;"; break;
      case '>': out += "&gt;"; break;
      case '&': out += "&amp;"; break;
      default: out += c;
    }
  }
  return out;
}

std::string tickText(double v) {
  char text[32];
  if (std::fabs(v) >= 1000 && std::fmod(v, 1000) == 0) {
    std::snprintf(text, sizeof text, "%gk", v / 1000);
  } else {
    std::snprintf(text, sizeof text, "%g", v);
  }
  return text;
}

}  // namespace

std::string renderSvg(const Chart& c) {
  const double W = 800, H = 470, left = 70, right = 20, top = 60, bottom = 55;
  const double pw = W - left - right, ph = H - top - bottom;
  auto fx = [&](double x) {
    const double t = c.logX ? (std::log10(x) - std::log10(c.xMin)) / (std::log10(c.xMax) - std::log10(c.xMin))
                            : (x - c.xMin) / (c.xMax - c.xMin);
    return left + t * pw;
  };
  auto fy = [&](double y) {
    const double clamped = y < c.yMin ? c.yMin : (y > c.yMax ? c.yMax : y);
    return top + (1.0 - (clamped - c.yMin) / (c.yMax - c.yMin)) * ph;
  };
  std::ostringstream s;
  s.precision(6);
  s << "<svg xmlns=\"http://www.w3.org/2000/svg\" width=\"" << W << "\" height=\"" << H
    << "\" font-family=\"sans-serif\" font-size=\"12\">\n"
    << "<rect width=\"100%\" height=\"100%\" fill=\"white\"/>\n"
    << "<text x=\"" << W / 2 << "\" y=\"24\" text-anchor=\"middle\" font-size=\"16\">" << escape(c.title)
    << "</text>\n";
  for (double x : c.xTicks) {
    s << "<line x1=\"" << fx(x) << "\" y1=\"" << top << "\" x2=\"" << fx(x) << "\" y2=\"" << top + ph
      << "\" stroke=\"#ddd\"/>\n<text x=\"" << fx(x) << "\" y=\"" << top + ph + 16
      << "\" text-anchor=\"middle\">" << tickText(x) << "</text>\n";
  }
  for (double y : c.yTicks) {
    s << "<line x1=\"" << left << "\" y1=\"" << fy(y) << "\" x2=\"" << left + pw << "\" y2=\"" << fy(y)
      << "\" stroke=\"#ddd\"/>\n<text x=\"" << left - 6 << "\" y=\"" << fy(y) + 4 << "\" text-anchor=\"end\">"
      << tickText(y) << "</text>\n";
  }
  s << "<rect x=\"" << left << "\" y=\"" << top << "\" width=\"" << pw << "\" height=\"" << ph
    << "\" fill=\"none\" stroke=\"#444\"/>\n"
    << "<text x=\"" << left + pw / 2 << "\" y=\"" << H - 12 << "\" text-anchor=\"middle\">"
    << escape(c.xLabel) << "</text>\n<text transform=\"translate(18," << top + ph / 2
    << ") rotate(-90)\" text-anchor=\"middle\">" << escape(c.yLabel) << "</text>\n";
  // The legend sits in a row above the plot, clear of the data.
  double legendX = left;
  for (const Series& series : c.series) {
    if (series.points.empty()) continue;
    s << "<polyline fill=\"none\" stroke-width=\"2\" stroke=\"" << series.colour << "\" points=\"";
    for (const auto& [x, y] : series.points) s << fx(x) << ',' << fy(y) << ' ';
    s << "\"/>\n";
    if (!series.label.empty()) {
      s << "<rect x=\"" << legendX << "\" y=\"" << top - 16 << "\" width=\"14\" height=\"4\" fill=\""
        << series.colour << "\"/><text x=\"" << legendX + 18 << "\" y=\"" << top - 10 << "\">"
        << escape(series.label) << "</text>\n";
      legendX += 30 + 7.0 * static_cast<double>(series.label.size());
    }
  }
  s << "</svg>\n";
  return s.str();
}

void writeTextFile(const std::string& path, const std::string& text) {
  const std::string temp = path + ".tmp-" + std::to_string(getpid());
  std::FILE* f = std::fopen(temp.c_str(), "wb");
  if (!f) throw WaveError(WaveError::Io, "'" + path + "': cannot write");
  const bool ok = std::fwrite(text.data(), 1, text.size(), f) == text.size();
  if (std::fclose(f) != 0 || !ok || std::rename(temp.c_str(), path.c_str()) != 0) {
    std::remove(temp.c_str());
    throw WaveError(WaveError::Io, "'" + path + "': cannot write");
  }
}

}  // namespace cli
