// tonebits plot: SVG pictures of an equaliser's response, the fader laws and
// an automation envelope.
#include <algorithm>
#include <cmath>
#include <cstdio>

#include "Automation.h"
#include "Cli.h"
#include "Commands.h"
#include "Equaliser.h"
#include "FaderLaw.h"
#include "Svg.h"

namespace cli {

namespace {

const char* kHelp =
    "usage: tonebits plot eq OUT.svg --eq BAND [--eq BAND]... [--rate HZ]\n"
    "       tonebits plot law OUT.svg [--law mixer|linear|power|all]\n"
    "       tonebits plot envelope OUT.svg --automation FILE [--seconds S]\n"
    "\n"
    "eq:       magnitude response in dB over a log frequency axis, each band\n"
    "          and the whole chain (bands as for 'tonebits process')\n"
    "law:      gain in dB against fader position for the fader laws\n"
    "envelope: the gain an automation file gives, in dB, against time\n";

const char* kColours[] = {"#1f77b4", "#ff7f0e", "#2ca02c", "#d62728", "#9467bd", "#8c564b"};

double toDb(double gain, double floor) { return gain > 0 ? std::max(floor, 20.0 * std::log10(gain)) : floor; }

Chart eqChart(const std::vector<BandSpec>& bands, double rate) {
  Chart c;
  c.title = "Equaliser response at " + std::to_string(static_cast<int>(rate)) + " Hz";
  c.xLabel = "frequency (Hz)";
  c.yLabel = "gain (dB)";
  c.logX = true;
  c.xMin = 10;
  c.xMax = rate / 2;
  c.xTicks = {20, 50, 100, 200, 500, 1000, 2000, 5000, 10000, 20000};
  c.xTicks.erase(std::remove_if(c.xTicks.begin(), c.xTicks.end(), [&](double x) { return x > c.xMax; }),
                 c.xTicks.end());
  std::vector<std::pair<std::string, Equaliser>> curves;
  for (std::size_t b = 0; b < bands.size() && bands.size() > 1; ++b)
    curves.emplace_back(bands[b].text, Equaliser({bands[b]}, static_cast<float>(rate), 1));
  curves.emplace_back(bands.size() > 1 ? "chain" : bands[0].text,
                      Equaliser(bands, static_cast<float>(rate), 1));
  double lo = -3, hi = 3;
  for (std::size_t k = 0; k < curves.size(); ++k) {
    Series s{curves[k].first, k + 1 == curves.size() ? "#000000" : kColours[k % 6], {}};
    for (int i = 0; i <= 400; ++i) {
      const double f = c.xMin * std::pow(c.xMax / c.xMin, i / 400.0) * (i == 400 ? 0.9999 : 1.0);
      const double db = toDb(curves[k].second.responseAt(f), -60);
      lo = std::min(lo, db);
      hi = std::max(hi, db);
      s.points.emplace_back(f, db);
    }
    c.series.push_back(std::move(s));
  }
  c.yMin = std::floor(lo / 6) * 6;
  c.yMax = std::ceil(hi / 6) * 6;
  for (double y = c.yMin; y <= c.yMax; y += (c.yMax - c.yMin) > 36 ? 12 : 6) c.yTicks.push_back(y);
  return c;
}

Chart lawChart(const std::string& which) {
  Chart c;
  c.title = "Fader laws";
  c.xLabel = "fader position (U)";
  c.yLabel = "gain (dB)";
  c.xMin = 0;
  c.xMax = 1.5;
  c.yMin = -72;
  c.yMax = 18;
  c.xTicks = {0, 0.25, 0.5, 0.75, 1.0, 1.25, 1.5};
  for (double y = -72; y <= 18; y += 12) c.yTicks.push_back(y);
  std::vector<Law> laws;
  if (which == "all") {
    laws = {Law::Linear, Law::Mixer, Law::Power};
  } else {
    laws = {parseLaw(which)};
  }
  for (std::size_t k = 0; k < laws.size(); ++k) {
    Series s{lawName(laws[k]), kColours[k], {}};
    const double top = maximumFader(laws[k]);
    for (int i = 0; i <= 600; ++i) {
      const double u = top * i / 600.0;
      s.points.emplace_back(u, toDb(faderToGain(laws[k], u), -72));
    }
    c.series.push_back(std::move(s));
  }
  return c;
}

Chart envelopeChart(const Aud::DynamicLevelControl::Store& store, double seconds) {
  Chart c;
  c.title = "Level automation";
  c.xLabel = "time (s)";
  c.yLabel = "gain (dB)";
  c.xMin = 0;
  c.xMax = seconds;
  c.yMin = -48;
  c.yMax = 12;
  const double step = seconds > 20 ? std::ceil(seconds / 10) : seconds > 5 ? 1 : 0.5;
  for (double x = 0; x <= seconds + 1e-9; x += step) c.xTicks.push_back(x);
  for (double y = -48; y <= 12; y += 12) c.yTicks.push_back(y);
  Series s{"gain", kColours[0], {}};
  for (int i = 0; i <= 1000; ++i) {
    const double t = seconds * i / 1000.0;
    s.points.emplace_back(t, toDb(store.getLevelAtTime(t), -48));
  }
  c.series.push_back(std::move(s));
  return c;
}

}  // namespace

int runPlot(int argc, char** argv, int first) {
  Args args(argc, argv, first, {"eq", "rate", "law", "automation", "seconds"}, {"help"});
  if (args.has("help")) {
    std::fputs(kHelp, stdout);
    return kOk;
  }
  if (args.positional().size() != 2) throw UsageError("plot takes a kind (eq, law or envelope) and OUT.svg");
  const std::string kind = args.positional()[0], out = args.positional()[1];
  Chart chart;
  if (kind == "eq") {
    std::vector<BandSpec> bands;
    for (const std::string& band : args.values("eq")) bands.push_back(parseBand(band));
    if (bands.empty()) throw UsageError("plot eq needs at least one --eq band");
    chart = eqChart(bands, parseNumber(args.value("rate", "48000"), "rate", 8000, 384000));
  } else if (kind == "law") {
    chart = lawChart(args.value("law", "all"));
  } else if (kind == "envelope") {
    if (!args.has("automation")) throw UsageError("plot envelope needs --automation FILE");
    const auto store = readAutomation(args.value("automation"));
    double last = 0;
    for (auto it = store->begin(); it != store->end(); ++it) last = std::max(last, it.getTime());
    const double seconds = args.has("seconds") ? parseNumber(args.value("seconds"), "seconds", 0.001, 1e6)
                                               : std::max(1.0, std::ceil(last * 1.1));
    chart = envelopeChart(*store, seconds);
  } else {
    throw UsageError("unknown plot kind '" + kind + "' (eq, law or envelope)");
  }
  writeTextFile(out, renderSvg(chart));
  std::printf("wrote %s\n", out.c_str());
  return kOk;
}

}  // namespace cli
