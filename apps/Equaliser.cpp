#include "Equaliser.h"

#include <cmath>
#include <cstdlib>
#include <variant>

#include "Cli.h"
#include "host/Exception.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"

namespace cli {

using Aud::Filter::Biquad;

BandSpec parseBand(const std::string& text) {
  std::vector<std::string> parts;
  for (std::size_t start = 0;;) {
    const std::size_t colon = text.find(':', start);
    parts.push_back(text.substr(start, colon == std::string::npos ? std::string::npos : colon - start));
    if (colon == std::string::npos) break;
    start = colon + 1;
  }
  if (parts.size() < 2 || parts.size() > 4)
    throw UsageError("bad band '" + text + "' (TYPE:FREQ[:WIDTH][:GAIN])");
  struct Name {
    const char* name;
    Biquad::eFilterType type;
  };
  static const Name kNames[] = {
      {"lowpass", Biquad::LowPass},
      {"highpass", Biquad::HighPass},
      {"bandpass", Biquad::BandPassSkirt},
      {"bandpass-peak", Biquad::BandPassPeak},
      {"notch", Biquad::Notch},
      {"allpass", Biquad::AllPass},
      {"peak", Biquad::PeakingEQ},
      {"lowshelf", Biquad::LowShelf},
      {"highshelf", Biquad::HighShelf},
  };
  BandSpec band{};
  band.text = text;
  bool known = false;
  for (const Name& n : kNames)
    if (parts[0] == n.name) band.type = n.type, known = true;
  if (!known) throw UsageError("unknown band type '" + parts[0] + "' in '" + text + "'");
  const bool shelf = band.type == Biquad::LowShelf || band.type == Biquad::HighShelf;
  band.frequency = static_cast<float>(parseNumber(parts[1], "band frequency", 1.0, 1e6));
  std::string width = parts.size() > 2 && !parts[2].empty() ? parts[2]
                                                            : (shelf                            ? "1s"
                                                               : band.type == Biquad::PeakingEQ ? "1q"
                                                                                                : "0.7071q");
  const char unit = width.back();
  const double amount = parseNumber(width.substr(0, width.size() - 1), "band width", 1e-4, 1e4);
  if (unit == 'q') {
    band.shape.setAsQ(static_cast<float>(amount));
  } else if (unit == 'o' && !shelf) {
    band.shape.setAsBandwidth(static_cast<float>(amount));
  } else if (unit == 's' && shelf) {
    band.shape.setAsS(static_cast<float>(amount));
  } else {
    throw UsageError("band width '" + width + "' does not suit '" + parts[0] +
                     "' (q, o for passes and peaks; q, s for shelves)");
  }
  band.gainDb = parts.size() > 3 ? parseNumber(parts[3], "band gain", -60.0, 60.0) : 0.0;
  return band;
}

namespace {

template <unsigned N>
struct Chains {
  std::vector<Aud::Filter::MultiBandBiquad<N>> filters;
  std::vector<Aud::Filter::MultiBandBiquad<N>*> pointers;
};

}  // namespace

struct Equaliser::Impl {
  std::vector<Biquad> single;
  std::vector<Biquad*> singlePointers;
  std::variant<std::monostate, Chains<2>, Chains<3>, Chains<4>, Chains<5>> chains;
};

namespace {

template <unsigned N>
void build(Chains<N>& c, const std::vector<BandSpec>& bands, float rate, unsigned channels) {
  c.filters.resize(channels);
  for (auto& f : c.filters) {
    for (unsigned b = 0; b < N; ++b) {
      f.getBand(b).configure(bands[b].type, bands[b].frequency, rate, bands[b].shape, bands[b].gainDb);
      f.getBand(b).setActive(true);
    }
    c.pointers.push_back(&f);
  }
}

}  // namespace

Equaliser::Equaliser(const std::vector<BandSpec>& bands, float sampleRate, unsigned channels)
    : bands_(static_cast<unsigned>(bands.size())),
      nyquist_(sampleRate / 2.0),
      impl_(std::make_unique<Impl>()) {
  if (bands.size() > 5) throw UsageError("at most five equaliser bands");
  for (const BandSpec& b : bands)
    if (!(b.frequency < sampleRate / 2))
      throw UsageError("band '" + b.text + "' lies above the Nyquist frequency (" +
                       std::to_string(sampleRate / 2) + " Hz)");
  try {
    switch (bands.size()) {
      case 0: break;
      case 1:
        impl_->single.assign(channels, Biquad(bands[0].type, bands[0].frequency, sampleRate, bands[0].shape,
                                              bands[0].gainDb, true));
        for (auto& b : impl_->single) impl_->singlePointers.push_back(&b);
        break;
      case 2: build(impl_->chains.emplace<Chains<2>>(), bands, sampleRate, channels); break;
      case 3: build(impl_->chains.emplace<Chains<3>>(), bands, sampleRate, channels); break;
      case 4: build(impl_->chains.emplace<Chains<4>>(), bands, sampleRate, channels); break;
      case 5: build(impl_->chains.emplace<Chains<5>>(), bands, sampleRate, channels); break;
    }
  } catch (const Kv::Exception::Base& e) {
    throw UsageError(std::string("equaliser: ") + e.getMessage());
  }
}

Equaliser::~Equaliser() = default;
Equaliser::Equaliser(Equaliser&&) noexcept = default;
Equaliser& Equaliser::operator=(Equaliser&&) noexcept = default;

void Equaliser::process(float* const* channels, unsigned count) {
  if (bands_ == 0) return;
  const unsigned n = static_cast<unsigned>(impl_->singlePointers.size());
  if (bands_ == 1) {
    Biquad::processBlockMultiChannel(impl_->singlePointers.data(), channels, channels, n, count);
    return;
  }
  std::visit(
      [&](auto& c) {
        if constexpr (!std::is_same_v<std::decay_t<decltype(c)>, std::monostate>) {
          using Chain = typename std::decay_t<decltype(c.filters)>::value_type;
          Chain::processBlockMultiChannel(c.pointers.data(), channels, channels,
                                          static_cast<unsigned>(c.pointers.size()), count);
        }
      },
      impl_->chains);
}

double Equaliser::responseAt(double hertz) const {
  if (bands_ == 0) return 1.0;
  hertz /= nyquist_;  // the filters take a fraction of the Nyquist frequency
  if (bands_ == 1)
    return impl_->single.empty() ? 1.0 : impl_->single[0].getResponseMagnitudeAtFrequency(float(hertz));
  return std::visit(
      [&](auto& c) -> double {
        if constexpr (std::is_same_v<std::decay_t<decltype(c)>, std::monostate>) {
          return 1.0;
        } else {
          return c.filters.empty() ? 1.0 : c.filters[0].getResponseMagnitudeAtFrequency(float(hertz));
        }
      },
      impl_->chains);
}

}  // namespace cli
