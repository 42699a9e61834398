// Internal fragment of Aud__BiquadCascade.cpp, included once per instruction
// set: the software-pipelined cascade and the code that moves filter state in
// and out of it. V is float (one channel) or a vector of floats (one channel
// per lane). The includer provides Lanes<V>, Plan, HistoryLanes,
// storeHistory, kChunkFrames and the arithmetic fragment.

// F floats of a frame to or from the first lanes of a V; the other lanes
// read as zero. The half-vector forms use the 64-bit moves: a partial copy
// through memory would stall every load on the store before it.
template <class V, unsigned F>
TB_INLINE void loadFrame(V& v, const float* p) noexcept {
  if constexpr (F * sizeof(float) == sizeof(V)) {
    std::memcpy(&v, p, sizeof(V));
  } else {
    static_assert(sizeof(V) == 16 && F == 2, "frames are whole vectors, or stereo in four lanes");
#if defined(__SSE2__)
    v = (V)_mm_castsi128_ps(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(p)));
#else
    v = V{};
    std::memcpy(&v, p, F * sizeof(float));
#endif
  }
}
template <class V, unsigned F>
TB_INLINE void storeFrame(float* p, const V& v) noexcept {
  if constexpr (F * sizeof(float) == sizeof(V)) {
    std::memcpy(p, &v, sizeof(V));
  } else {
#if defined(__SSE2__)
    _mm_storel_epi64(reinterpret_cast<__m128i*>(p), _mm_castps_si128((__m128)v));
#else
    std::memcpy(p, &v, F * sizeof(float));
#endif
  }
}

// Where frame t is read and written. Contiguous: F floats at in[t * inStride]
// and out[t * outStride] (one channel, or interleaved channels filling the
// lanes). Pair: two channels in their own buffers (planar stereo).
template <class V, unsigned F>
struct Contiguous {
  const float* in;
  float* out;
  std::ptrdiff_t inStride, outStride;
  TB_INLINE void load(V& v, std::ptrdiff_t t) const noexcept { loadFrame<V, F>(v, in + t * inStride); }
  TB_INLINE void store(std::ptrdiff_t t, const V& v) const noexcept {
    storeFrame<V, F>(out + t * outStride, v);
  }
};

#if defined(__SSE2__)
template <class V>
struct Pair {
  static_assert(sizeof(V) == 16);
  const float *in0, *in1;
  float *out0, *out1;
  std::ptrdiff_t inStride, outStride;
  TB_INLINE void load(V& v, std::ptrdiff_t t) const noexcept {
    v = (V)_mm_unpacklo_ps(_mm_load_ss(in0 + t * inStride), _mm_load_ss(in1 + t * inStride));
  }
  TB_INLINE void store(std::ptrdiff_t t, const V& v) const noexcept {
    const __m128 both = (__m128)v;
    _mm_store_ss(out0 + t * outStride, both);
    _mm_store_ss(out1 + t * outStride, _mm_shuffle_ps(both, both, 1));
  }
};
#endif

template <class V>
struct Stage {
  V b0, b1, b2, a1, a2;
  V x1, x2, y1, y2;
};

// Stage k of a pipeline of m at step t, on frame t - k: its input is frame t
// for the first stage, else the previous stage's last output, which the
// caller has not replaced yet (stages go last first).
template <class V, class Frames>
TB_INLINE void stageStep(Stage<V>* stages, unsigned k, unsigned m, const Frames& io,
                         std::ptrdiff_t t) noexcept {
  Stage<V>& st = stages[k];
  V x, y;
  if (k == 0)
    io.load(x, t);
  else
    x = stages[k - 1].y1;
  directFormOne(y, st.b0, st.b1, st.b2, st.a1, st.a2, x, st.x1, st.x2, st.y1, st.y2);
  st.x2 = st.x1;
  st.x1 = x;
  st.y2 = st.y1;
  st.y1 = y;
  if (k == m - 1) io.store(t - std::ptrdiff_t(k), y);
}

// Steps [begin, end) while the pipeline fills or drains: only the stages
// that have a frame run. Few steps per call, so the state stays in memory.
template <class V, class Frames>
__attribute__((noinline)) void partialSteps(Stage<V>* stages, unsigned m, const Frames& io,
                                            std::ptrdiff_t begin, std::ptrdiff_t end,
                                            std::ptrdiff_t count) noexcept {
  for (std::ptrdiff_t t = begin; t < end; ++t)
    for (unsigned k = m; k-- > 0;)
      if (t - std::ptrdiff_t(k) >= 0 && t - std::ptrdiff_t(k) < count) stageStep<V>(stages, k, m, io, t);
}

// Steps [begin, end), every stage busy: the hot loop, with the M stages'
// state in registers.
template <class V, unsigned M, class Frames>
__attribute__((noinline)) void fullSteps(Stage<V>* stages, const Frames& frames, std::ptrdiff_t begin,
                                         std::ptrdiff_t end) noexcept {
  Stage<V> s[M];
  for (unsigned k = 0; k < M; ++k) s[k] = stages[k];
  const Frames io = frames;
  const auto step = [&](std::ptrdiff_t t) __attribute__((always_inline)) {
    [&]<unsigned... I>(std::integer_sequence<unsigned, I...>) __attribute__((always_inline)) {
      (stageStep<V>(s, M - 1 - I, M, io, t), ...);
    }
    (std::make_integer_sequence<unsigned, M>());
  };
  std::ptrdiff_t t = begin;
  for (; t + 1 < end; t += 2) {  // two steps a turn: the history rotates through registers without copies
    step(t);
    step(t + 1);
  }
  if (t < end) step(t);
  for (unsigned k = 0; k < M; ++k) stages[k] = s[k];
}

// m (0 to kMaxBands) stages over count frames.
template <class V, class Frames>
void runStages(Stage<V>* stages, unsigned m, const Frames& io, std::ptrdiff_t count) noexcept {
  const std::ptrdiff_t fill = std::ptrdiff_t(m) - 1;
  partialSteps<V>(stages, m, io, 0, fill, count);
  if (count > fill) {
    switch (m) {
      case 1: fullSteps<V, 1>(stages, io, fill, count); break;
      case 2: fullSteps<V, 2>(stages, io, fill, count); break;
      case 3: fullSteps<V, 3>(stages, io, fill, count); break;
      case 4: fullSteps<V, 4>(stages, io, fill, count); break;
      case 5: fullSteps<V, 5>(stages, io, fill, count); break;
    }
  }
  partialSteps<V>(stages, m, io, count > fill ? count : fill, count + fill, count);
}

template <class V>
void loadStages(Stage<V>* stages, Biquad* const* chains, unsigned lanes, const Plan& plan) noexcept {
  constexpr unsigned W = Lanes<V>::kCount;
  for (unsigned i = 0; i < plan.stages; ++i) {
    // Lanes without a channel filter zeros with zero coefficients; their
    // results are not used.
    float c[5][W] = {}, h[4][W] = {};
    for (unsigned l = 0; l < lanes; ++l) {
      Biquad& band = chains[l][plan.kept[i]];
      for (unsigned j = 0; j < 5; ++j) c[j][l] = BiquadAccess::coefficients(band)[j];
      const auto& history = BiquadAccess::history(band);
      h[0][l] = history.x1;
      h[1][l] = history.x2;
      h[2][l] = history.y1;
      h[3][l] = history.y2;
    }
    Stage<V>& st = stages[i];
    loadFrame<V, W>(st.b0, c[0]);
    loadFrame<V, W>(st.b1, c[1]);
    loadFrame<V, W>(st.b2, c[2]);
    loadFrame<V, W>(st.a1, c[3]);
    loadFrame<V, W>(st.a2, c[4]);
    loadFrame<V, W>(st.x1, h[0]);
    loadFrame<V, W>(st.x2, h[1]);
    loadFrame<V, W>(st.y1, h[2]);
    loadFrame<V, W>(st.y2, h[3]);
  }
}

// The lanes' channels through the plan's stages: in place on the caller's
// buffer when the lanes are its interleaved channels (F floats a frame), or
// gathered into frames of W, filtered and scattered back, a chunk at a time.
// The plan has no band that is on in some lanes and off in others.
template <class V>
void runGroup(Biquad* const* chains, unsigned lanes, unsigned nBands, const Plan& plan, const LaneBuffers& io,
              std::ptrdiff_t count) noexcept {
  constexpr unsigned W = Lanes<V>::kCount;
  float lastIn[kMaxLanes];
  for (unsigned l = 0; l < lanes; ++l) lastIn[l] = io.in[l][(count - 1) * io.inStride];
  HistoryLanes<W> h[kMaxBands];
  if (plan.stages == 0) {
    for (unsigned l = 0; l < lanes; ++l)
      if (io.in[l] != io.out[l])
        for (std::ptrdiff_t n = 0; n < count; ++n) io.out[l][n * io.outStride] = io.in[l][n * io.inStride];
    storeHistory<W>(h, chains, lanes, nBands, plan, lastIn);
    return;
  }

  Stage<V> stages[kMaxBands];
  loadStages(stages, chains, lanes, plan);
  bool adjacent = io.inStride == std::ptrdiff_t(lanes) && io.outStride == std::ptrdiff_t(lanes);
  for (unsigned l = 1; adjacent && l < lanes; ++l)
    adjacent = io.in[l] == io.in[0] + l && io.out[l] == io.out[0] + l;
  const std::ptrdiff_t inStride = io.inStride, outStride = io.outStride;
  bool done = false;
  if constexpr (W == 1) {
    runStages(stages, plan.stages, Contiguous<V, 1>{io.in[0], io.out[0], inStride, outStride}, count);
    done = true;
  } else if (adjacent && lanes == W) {
    runStages(stages, plan.stages, Contiguous<V, W>{io.in[0], io.out[0], inStride, outStride}, count);
    done = true;
  }
#if defined(__SSE2__)
  if constexpr (W == 4) {
    if (!done && lanes == 2) {  // stereo, interleaved or in two buffers
      if (adjacent)
        runStages(stages, plan.stages, Contiguous<V, 2>{io.in[0], io.out[0], inStride, outStride}, count);
      else
        runStages(stages, plan.stages, Pair<V>{io.in[0], io.in[1], io.out[0], io.out[1], inStride, outStride},
                  count);
      done = true;
    }
  }
#endif
  if (!done) {
    alignas(32) float frames[kChunkFrames * W];
    const Contiguous<V, W> scratch{frames, frames, W, W};
    for (std::ptrdiff_t first = 0; first < count; first += kChunkFrames) {
      const std::ptrdiff_t n = count - first < kChunkFrames ? count - first : kChunkFrames;
      for (std::ptrdiff_t f = 0; f < n; ++f)
        for (unsigned l = 0; l < W; ++l)
          frames[f * W + l] = l < lanes ? io.in[l][(first + f) * inStride] : 0.0f;
      runStages(stages, plan.stages, scratch, n);
      for (unsigned l = 0; l < lanes; ++l)
        for (std::ptrdiff_t f = 0; f < n; ++f) io.out[l][(first + f) * outStride] = frames[f * W + l];
    }
  }
  for (unsigned i = 0; i < plan.stages; ++i) {
    storeFrame<V, W>(h[i][0], stages[i].x1);
    storeFrame<V, W>(h[i][1], stages[i].x2);
    storeFrame<V, W>(h[i][2], stages[i].y1);
    storeFrame<V, W>(h[i][3], stages[i].y2);
  }
  storeHistory<W>(h, chains, lanes, nBands, plan, lastIn);
}
