// Fused multiply-adds at full speed where the processor has them, and with the same bits where the
// C library has to emulate them.
//
// A kernel is written once, as functions marked ORVALIS_KERNEL, and compiled into two bodies: a
// portable one and, on x86-64, one with FMA instructions. Callers choose by has_fma(). Other
// processors either always have fused multiply-adds or never do.
#pragma once

/// A function of a kernel, compiled into either body.
#define ORVALIS_KERNEL [[gnu::always_inline]] inline

#if defined(__x86_64__)
/// The body for processors with fused multiply-adds.
#define ORVALIS_WITH_FMA [[gnu::target("fma")]]
#else
#define ORVALIS_WITH_FMA
#endif

namespace orvalis {

/// Whether the body for fused multiply-adds may run and differs from the portable one.
inline bool has_fma() {
#if defined(__x86_64__)
  return __builtin_cpu_supports("fma") != 0;
#else
  return false;
#endif
}

}  // namespace orvalis
