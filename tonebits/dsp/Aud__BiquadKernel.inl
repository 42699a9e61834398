// Internal fragment of Aud__BiquadCascade.cpp, included once per instruction
// set: the software-pipelined cascade and the code that moves filter state in
// and out of it. V is float (one channel) or a vector of floats (one channel
// per lane); the includer provides Lanes<V>, Plan, storeHistory, the
// arithmetic fragment and kChunkFrames.

template <class V>
TB_INLINE void load(V& v, const float* p) noexcept {
  std::memcpy(&v, p, sizeof(V));
}
template <class V>
TB_INLINE void store(float* p, const V& v) noexcept {
  std::memcpy(p, &v, sizeof(V));
}

template <class V>
struct Stage {
  V b0, b1, b2, a1, a2;
  V x1, x2, y1, y2;
};

template <class V, unsigned M>
struct CascadeState {
  Stage<V> stage[M];
  // All ones in the lanes where the band is active; read only when some
  // stage is active in some lanes and not in others.
  typename Lanes<V>::Mask active[M];
};

// M stages software-pipelined over count frames of V. Blend: some stage is
// inactive in some lanes, which then pass their input through.
template <class V, unsigned M, bool Blend>
struct Cascade {
  using State = CascadeState<V, M>;

  // Stage K at step t, on frame t - K.
  template <unsigned K>
  static TB_INLINE void step(State& s, const float* in, std::ptrdiff_t inStride, float* out,
                             std::ptrdiff_t outStride, std::ptrdiff_t t) noexcept {
    Stage<V>& st = s.stage[K];
    V x;
    if constexpr (K == 0)
      load(x, in + t * inStride);
    else
      x = s.stage[K - 1].y1;  // stage K - 1's output of the previous step
    V y;
    directFormOne(y, st.b0, st.b1, st.b2, st.a1, st.a2, x, st.x1, st.x2, st.y1, st.y2);
    if constexpr (Blend) {
      using Mask = typename Lanes<V>::Mask;
      y = (V)(((Mask)y & s.active[K]) | ((Mask)x & ~s.active[K]));
    }
    st.x2 = st.x1;
    st.x1 = x;
    st.y2 = st.y1;
    st.y1 = y;
    if constexpr (K == M - 1) store(out + (t - std::ptrdiff_t(K)) * outStride, y);
  }

  // Stages run last first, so each reads its predecessor's previous output
  // before the predecessor replaces it.
  template <unsigned... I>
  static TB_INLINE void fullStep(State& s, const float* in, std::ptrdiff_t inStride, float* out,
                                 std::ptrdiff_t outStride, std::ptrdiff_t t,
                                 std::integer_sequence<unsigned, I...>) noexcept {
    (step<M - 1 - I>(s, in, inStride, out, outStride, t), ...);
  }
  // Filling and draining the pipeline: only the stages that have a frame.
  template <unsigned... I>
  static TB_INLINE void partialStep(State& s, const float* in, std::ptrdiff_t inStride, float* out,
                                    std::ptrdiff_t outStride, std::ptrdiff_t t, std::ptrdiff_t count,
                                    std::integer_sequence<unsigned, I...>) noexcept {
    ((t - std::ptrdiff_t(M - 1 - I) >= 0 && t - std::ptrdiff_t(M - 1 - I) < count
          ? step<M - 1 - I>(s, in, inStride, out, outStride, t)
          : void()),
     ...);
  }

  static TB_INLINE void run(State& state, const float* in, std::ptrdiff_t inStride, float* out,
                            std::ptrdiff_t outStride, std::ptrdiff_t count) noexcept {
    State s = state;  // a local copy, so the history lives in registers
    constexpr auto stages = std::make_integer_sequence<unsigned, M>();
    const std::ptrdiff_t fill = count < std::ptrdiff_t(M - 1) ? count : std::ptrdiff_t(M - 1);
    std::ptrdiff_t t = 0;
    for (; t < fill; ++t) partialStep(s, in, inStride, out, outStride, t, count, stages);
    for (; t < count; ++t) fullStep(s, in, inStride, out, outStride, t, stages);
    for (; t < count + std::ptrdiff_t(M - 1); ++t) partialStep(s, in, inStride, out, outStride, t, count, stages);
    state = s;
  }
};

template <class V, unsigned M>
TB_INLINE void loadState(CascadeState<V, M>& s, Biquad* const* chains, unsigned lanes, const Plan& plan) noexcept {
  constexpr unsigned W = Lanes<V>::kCount;
  for (unsigned i = 0; i < M; ++i) {
    // Lanes without an active band (and lanes without a channel) filter with
    // zero coefficients from zero history, and their result is not used.
    float c[5][W] = {}, h[4][W] = {};
    int32_t active[W] = {};
    for (unsigned l = 0; l < lanes && l < W; ++l) {
      Biquad& band = chains[l][plan.kept[i]];
      if (!BiquadAccess::active(band)) continue;
      for (unsigned j = 0; j < 5; ++j) c[j][l] = BiquadAccess::coefficients(band)[j];
      const auto& history = BiquadAccess::history(band);
      h[0][l] = history.x1;
      h[1][l] = history.x2;
      h[2][l] = history.y1;
      h[3][l] = history.y2;
      active[l] = -1;
    }
    Stage<V>& st = s.stage[i];
    load(st.b0, c[0]);
    load(st.b1, c[1]);
    load(st.b2, c[2]);
    load(st.a1, c[3]);
    load(st.a2, c[4]);
    load(st.x1, h[0]);
    load(st.x2, h[1]);
    load(st.y1, h[2]);
    load(st.y2, h[3]);
    std::memcpy(&s.active[i], active, sizeof(active));
  }
}

template <class V, unsigned M>
TB_INLINE void extractHistory(const CascadeState<V, M>& s, HistoryLanes<Lanes<V>::kCount>* h) noexcept {
  for (unsigned i = 0; i < M; ++i) {
    store(h[i][0], s.stage[i].x1);
    store(h[i][1], s.stage[i].x2);
    store(h[i][2], s.stage[i].y1);
    store(h[i][3], s.stage[i].y2);
  }
}

// Frames gathered from the lanes' buffers, filtered and scattered back, a
// chunk at a time; or filtered where they are when the lanes are exactly the
// interleaved channels of one buffer (or there is one lane).
template <class V, unsigned M, bool Blend>
TB_INLINE void runPlanned(Biquad* const* chains, unsigned lanes, unsigned nBands, const Plan& plan,
                          const LaneBuffers& io, std::ptrdiff_t count) noexcept {
  constexpr unsigned W = Lanes<V>::kCount;
  float lastIn[W];
  for (unsigned l = 0; l < lanes; ++l) lastIn[l] = io.in[l][(count - 1) * io.inStride];

  if constexpr (M == 0) {
    for (unsigned l = 0; l < lanes; ++l)
      if (io.in[l] != io.out[l])
        for (std::ptrdiff_t n = 0; n < count; ++n) io.out[l][n * io.outStride] = io.in[l][n * io.inStride];
    storeHistory<W>(nullptr, chains, lanes, nBands, plan, lastIn);
  } else {
    CascadeState<V, M> state;
    loadState(state, chains, lanes, plan);
    bool direct = lanes == W && (W == 1 || (io.inStride == std::ptrdiff_t(W) && io.outStride == std::ptrdiff_t(W)));
    for (unsigned l = 1; direct && l < lanes; ++l) direct = io.in[l] == io.in[0] + l && io.out[l] == io.out[0] + l;
    if (direct) {
      Cascade<V, M, Blend>::run(state, io.in[0], io.inStride, io.out[0], io.outStride, count);
    } else {
      alignas(32) float frames[kChunkFrames * W];
      for (std::ptrdiff_t first = 0; first < count; first += kChunkFrames) {
        const std::ptrdiff_t n = count - first < kChunkFrames ? count - first : kChunkFrames;
        for (std::ptrdiff_t f = 0; f < n; ++f)
          for (unsigned l = 0; l < W; ++l)
            frames[f * W + l] = l < lanes ? io.in[l][(first + f) * io.inStride] : 0.0f;
        Cascade<V, M, Blend>::run(state, frames, W, frames, W, n);
        for (unsigned l = 0; l < lanes; ++l)
          for (std::ptrdiff_t f = 0; f < n; ++f) io.out[l][(first + f) * io.outStride] = frames[f * W + l];
      }
    }
    HistoryLanes<W> h[M];
    extractHistory(state, h);
    storeHistory<W>(h, chains, lanes, nBands, plan, lastIn);
  }
}

template <class V>
TB_INLINE void runGroup(Biquad* const* chains, unsigned lanes, unsigned nBands, const LaneBuffers& io,
                        unsigned count) noexcept {
  if (count == 0) return;
  const Plan plan = makePlan(chains, lanes, nBands);
  const std::ptrdiff_t n = count;
  if (plan.mixed) {
    if constexpr (Lanes<V>::kCount > 1) {
      switch (plan.stages) {
        case 1: return runPlanned<V, 1, true>(chains, lanes, nBands, plan, io, n);
        case 2: return runPlanned<V, 2, true>(chains, lanes, nBands, plan, io, n);
        case 3: return runPlanned<V, 3, true>(chains, lanes, nBands, plan, io, n);
        case 4: return runPlanned<V, 4, true>(chains, lanes, nBands, plan, io, n);
        case 5: return runPlanned<V, 5, true>(chains, lanes, nBands, plan, io, n);
      }
    }
    return;
  }
  switch (plan.stages) {
    case 0: return runPlanned<V, 0, false>(chains, lanes, nBands, plan, io, n);
    case 1: return runPlanned<V, 1, false>(chains, lanes, nBands, plan, io, n);
    case 2: return runPlanned<V, 2, false>(chains, lanes, nBands, plan, io, n);
    case 3: return runPlanned<V, 3, false>(chains, lanes, nBands, plan, io, n);
    case 4: return runPlanned<V, 4, false>(chains, lanes, nBands, plan, io, n);
    case 5: return runPlanned<V, 5, false>(chains, lanes, nBands, plan, io, n);
  }
}
