// Internal fragment, included (inside a namespace) by the filter sources,
// once per instruction set they compile for: the one recurrence every filter
// path runs, on a float or on a vector of floats.
//
// Each operation is pinned to one instruction with its operands in a fixed
// order. Plain operators would let the compiler commute an addition or a
// product, and x86 returns the first source's NaN when both operands are
// NaN, so two paths could disagree on the bits of a NaN. Pinned, every path
// yields the same bits for every input. The rule, everywhere: a sum or
// difference keeps its left operand's NaN, a product its signal operand's.
//
// The includer defines TB_INLINE and TB_VEX (1 where the surrounding code is
// compiled for AVX, so that the three-operand forms are used and no legacy
// SSE instruction meets AVX state).

#if defined(__x86_64__) || defined(__i386__)
#if TB_VEX
// r = a op b, b possibly in memory.
#define TB_ARITH_FORM(insn) asm("v" insn " %2, %1, %0" : "=x"(r) : "x"(a), "xm"(b));
#else
// r = a, then r op= b, b possibly in memory (V's alignment makes a packed
// memory operand legal).
#define TB_ARITH_FORM(insn) \
  r = a;                    \
  asm(insn " %1, %0" : "+x"(r) : "xm"(b));
#endif
#define TB_ARITH(ps, ss)          \
  if constexpr (sizeof(V) == 4) { \
    TB_ARITH_FORM(ss)             \
  } else {                        \
    TB_ARITH_FORM(ps)             \
  }
#endif

template <class V>
TB_INLINE void sum(V& r, const V& a, const V& b) noexcept {
#if defined(__x86_64__) || defined(__i386__)
  TB_ARITH("addps", "addss")
#else
  r = a + b;
#endif
}

template <class V>
TB_INLINE void difference(V& r, const V& a, const V& b) noexcept {
#if defined(__x86_64__) || defined(__i386__)
  TB_ARITH("subps", "subss")
#else
  r = a - b;
#endif
}

// Signal a times coefficient b.
template <class V>
TB_INLINE void product(V& r, const V& a, const V& b) noexcept {
#if defined(__x86_64__) || defined(__i386__)
  TB_ARITH("mulps", "mulss")
#else
  r = a * b;
#endif
}

#undef TB_ARITH
#undef TB_ARITH_FORM

// y = (b0*x + b1*x1) + b2*x2 - a1*y1 - a2*y2, left to right, single
// precision, no fused multiply-add.
template <class V>
TB_INLINE void directFormOne(V& y, const V& b0, const V& b1, const V& b2, const V& a1, const V& a2,
                             const V& x, const V& x1, const V& x2, const V& y1, const V& y2) noexcept {
  V term, acc;
  product(acc, x, b0);
  product(term, x1, b1);
  sum(acc, acc, term);
  product(term, x2, b2);
  sum(acc, acc, term);
  product(term, y1, a1);
  difference(acc, acc, term);
  product(term, y2, a2);
  difference(y, acc, term);
}
