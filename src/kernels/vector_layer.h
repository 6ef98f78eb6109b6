// The portable vector layer (Highway) as the kernels use it; include this instead of highway.h.
//
// What stands between HWY_BEFORE_NAMESPACE() and HWY_AFTER_NAMESPACE(), plain loops included, is
// compiled for the processor family's vector instructions: on x86-64 AVX2 with FMA and F16C, which
// the processor check of the C interface has seen before anything here runs; elsewhere what every
// processor of the family has (NEON, WebAssembly SIMD). All other code of the engine is baseline.
// A unit that is compiled again for wider registers defines HWY_TARGET_INCLUDE as its own name.
//
// Sums run in a fixed order of eight interleaved partial sums, however wide the registers are: the
// same bits on every processor of a family.
#ifndef MORVA_VECTOR_LAYER  // and no "#pragma once": Highway's own header is seen once per width
#define MORVA_VECTOR_LAYER

#ifdef __x86_64__
#define HWY_BASELINE_TARGETS HWY_AVX2
#else
#define TOOLCHAIN_MISS_SYS_AUXV_H  // to Highway: nothing beyond the baseline is asked for
#endif
#define HWY_DISABLED_TARGETS (HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128)
#ifdef HWY_TARGET_INCLUDE
#include <hwy/foreach_target.h>
#else
#define HWY_COMPILE_ONLY_STATIC
#endif

#endif
#include <hwy/highway.h>
