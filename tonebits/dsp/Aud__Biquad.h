// One second-order recursive filter for one channel of float samples: the
// building block of the library's equalisers.
//
// configure() turns a response type, a corner or centre frequency, the
// sampling rate, a shape (bandwidth in octaves, Q or shelf slope S) and a gain
// in dB into coefficients by the well-known cookbook designs, in double
// precision, and stores them normalised and rounded to float. processSample()
// then runs direct form I in single precision:
//
//   y = (b0*x + b1*x1) + b2*x2 - a1*y1 - a2*y2
//
// summed left to right, with no fused multiply-add, so a given input always
// produces the same bits, NaNs included (where two NaNs meet, a sum or
// difference keeps its left operand's, a product the signal's). An inactive
// filter passes samples unchanged and records the last one as its last
// result.
//
// processBlock() and the multichannel forms give exactly the bits of calling
// processSample() once per sample, and are two to eight times faster.
//
// Errors: configure(), setActive(true) on an unconfigured filter and the
// response of an active unconfigured filter throw Kv::Exception::RuntimeError
// by value; a throw leaves the filter exactly as it was. Block calls given a
// null buffer (with samples to process) report it through vel_splat and touch
// nothing.
//
// A filter belongs to one caller at a time.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tonebits/export.h"

namespace Aud::Filter {

struct BiquadAccess;

class TONEBITS_API Biquad {
 public:
  enum eFilterType : int32_t {
    NoFilter = 0,  // not configured
    LowPass = 1,
    HighPass = 2,
    BandPassSkirt = 3,  // constant skirt gain: the peak gain equals Q
    BandPassPeak = 4,   // constant 0 dB peak gain
    Notch = 5,
    AllPass = 6,
    PeakingEQ = 7,
    LowShelf = 8,
    HighShelf = 9,
  };

  // How the width of the response is given. LowPass to PeakingEQ take a
  // bandwidth or a Q, the shelves a Q or a slope S.
  class ShapeDescriptor {
   public:
    enum eType : int32_t { NoShape = 0, Bandwidth = 1, Q = 2, S = 3 };

    ShapeDescriptor() noexcept = default;
    ShapeDescriptor(eType kind, float amount) noexcept : type(kind), value(amount) {}

    void setAsBandwidth(float octaves) noexcept { set(Bandwidth, octaves); }
    void setAsQ(float q) noexcept { set(Q, q); }
    void setAsS(float slope) noexcept { set(S, slope); }
    eType getType() const noexcept { return type; }
    float getValue() const noexcept { return value; }

   private:
    void set(eType t, float v) noexcept {
      type = t;
      value = v;
    }
    eType type = NoShape;
    float value = 0.0f;
  };

  // Inactive, unconfigured, history zero.
  Biquad() noexcept = default;
  // Biquad(), then configure(), then setActive(active).
  Biquad(eFilterType type, float frequency, float samplingRate, const ShapeDescriptor& shape, double gain,
         bool active);

  // Computes and stores the coefficients and the five parameters; leaves the
  // active flag and the history alone, so a running filter changes its
  // response without a click from a reset. Throws "ShapeDescriptor/FilterType
  // mismatch" when the type does not take the shape's kind and "Unknown
  // filter type" for NoFilter or a value outside the enumeration.
  void configure(eFilterType type, float frequency, float samplingRate, const ShapeDescriptor& shape,
                 double gain);

  bool getActive() const noexcept { return active; }
  // Switching on an unconfigured filter throws "Filter is not configured!";
  // switching off always succeeds.
  void setActive(bool on);

  // One sample through the filter. Inactive: returns x and records it as
  // the last result, keeping the rest of the history.
  float processSample(float x) noexcept;
  // count samples from in to out, exactly as count calls of processSample().
  // in == out is allowed; otherwise the buffers must not overlap.
  void processBlock(const float* in, float* out, unsigned count) noexcept;

  // Several channels at once: filters[c] runs over channel c, with exactly
  // the bits of running each channel through its own filter with
  // processBlock. Channels whose filters are switched on alike share SIMD
  // lanes (four or eight at a time, as the CPU allows); the others, and a
  // filter listed twice, run one channel after another, in channel order.
  // In place is allowed; otherwise no buffers may overlap. A null list,
  // filter or buffer, or a stride below 1, is reported through vel_splat and
  // nothing is touched (nothing is checked when there is nothing to do).
  //
  // Planar: channel c's count samples are in[c][0 .. count) and go to out[c].
  static void processBlockMultiChannel(Biquad* const* filters, const float* const* in, float* const* out,
                                       unsigned channels, unsigned count) noexcept;
  // Interleaved frames: channel c of frame n is at [n * channels + c] of in
  // and out, which hold frames * channels samples.
  static void processBlockInterleaved(Biquad* const* filters, const float* in, float* out, unsigned channels,
                                      unsigned frames) noexcept;
  // Any layout, e.g. planar in and interleaved out: channel c's sample n is
  // read from in[c][n * inStride] and written to out[c][n * outStride].
  static void processBlockStrided(Biquad* const* filters, const float* const* in, std::ptrdiff_t inStride,
                                  float* const* out, std::ptrdiff_t outStride, unsigned channels,
                                  unsigned count) noexcept;

  // The last output (the last input while inactive).
  float getLastProcessSampleResult() const noexcept { return history.y1; }
  // Zeroes the history only.
  void reset() noexcept { history = History{}; }

  // |H| at f, a fraction of the Nyquist frequency (1.0 is half the sampling
  // rate), from the unrounded coefficients in double precision. 1.0 while
  // inactive; an active unconfigured filter throws "Biquad is not
  // configured!".
  float getResponseMagnitudeAtFrequency(float f) const;

  eFilterType getFilterType() const noexcept { return filterType; }
  float getFrequency() const noexcept { return frequency; }
  float getSamplingRate() const noexcept { return samplingRate; }
  const ShapeDescriptor& getShapeDescriptor() const noexcept { return shape; }
  double getGain() const noexcept { return gain; }

 private:
  friend struct BiquadAccess;

  struct History {
    float x1 = 0.0f, x2 = 0.0f;  // the last two inputs
    float y1 = 0.0f, y2 = 0.0f;  // the last two outputs
  };

  bool active = false;
  float coefficients[5] = {};      // b0/a0, b1/a0, b2/a0, a1/a0, a2/a0
  double rawCoefficients[6] = {};  // a0, a1, a2, b0, b1, b2
  History history;
  eFilterType filterType = NoFilter;
  float frequency = 0.0f;     // Hz
  float samplingRate = 0.0f;  // Hz
  ShapeDescriptor shape;
  double gain = 0.0;  // dB
};

}  // namespace Aud::Filter
