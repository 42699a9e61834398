// Internal fragment, included (inside a namespace) by the filter sources,
// once per instruction set they compile for: the one recurrence every filter
// path runs, on a float or on a vector of floats.
//
// Each operation is pinned to one instruction with its operands in the
// written order. Plain operators would let the compiler commute an addition
// or a product, and x86 returns the first operand's NaN when both are NaN, so
// two paths could disagree on the bits of a NaN. Pinned, every path yields the
// same bits for every input.
//
// The includer defines TB_INLINE and TB_VEX_OR(vex, legacy), which picks the
// encoding of the 128-bit and scalar forms for the code around it.

template <class V>
TB_INLINE void addTo(V& a, const V& b) noexcept {
#if defined(__x86_64__) || defined(__i386__)
  if constexpr (sizeof(V) == 32)
    asm("vaddps %1, %0, %0" : "+x"(a) : "x"(b));
  else if constexpr (sizeof(V) == 4)
    asm(TB_VEX_OR("vaddss %1, %0, %0", "addss %1, %0") : "+x"(a) : "x"(b));
  else
    asm(TB_VEX_OR("vaddps %1, %0, %0", "addps %1, %0") : "+x"(a) : "x"(b));
#else
  a = a + b;
#endif
}

template <class V>
TB_INLINE void subtractFrom(V& a, const V& b) noexcept {
#if defined(__x86_64__) || defined(__i386__)
  if constexpr (sizeof(V) == 32)
    asm("vsubps %1, %0, %0" : "+x"(a) : "x"(b));
  else if constexpr (sizeof(V) == 4)
    asm(TB_VEX_OR("vsubss %1, %0, %0", "subss %1, %0") : "+x"(a) : "x"(b));
  else
    asm(TB_VEX_OR("vsubps %1, %0, %0", "subps %1, %0") : "+x"(a) : "x"(b));
#else
  a = a - b;
#endif
}

// c * v, c first.
template <class V>
TB_INLINE void product(V& out, const V& c, const V& v) noexcept {
  out = c;
#if defined(__x86_64__) || defined(__i386__)
  if constexpr (sizeof(V) == 32)
    asm("vmulps %1, %0, %0" : "+x"(out) : "x"(v));
  else if constexpr (sizeof(V) == 4)
    asm(TB_VEX_OR("vmulss %1, %0, %0", "mulss %1, %0") : "+x"(out) : "x"(v));
  else
    asm(TB_VEX_OR("vmulps %1, %0, %0", "mulps %1, %0") : "+x"(out) : "x"(v));
#else
  out = out * v;
#endif
}

// y = (b0*x + b1*x1) + b2*x2 - a1*y1 - a2*y2, left to right, single
// precision, no fused multiply-add.
template <class V>
TB_INLINE void directFormOne(V& y, const V& b0, const V& b1, const V& b2, const V& a1, const V& a2, const V& x,
                             const V& x1, const V& x2, const V& y1, const V& y2) noexcept {
  V term;
  product(y, b0, x);
  product(term, b1, x1);
  addTo(y, term);
  product(term, b2, x2);
  addTo(y, term);
  product(term, a1, y1);
  subtractFrom(y, term);
  product(term, a2, y2);
  subtractFrom(y, term);
}
