// The plan record, its per-factor stage records and the kernel entry points
// they select. Shared between the plan list, the drivers and the kernels.
//
// Kernel legend: re/im are separate real and imaginary sequences, strides are
// counted in doubles (interleaved complex data is base, base + 1, stride 2);
// `is`/`os` input/output stride, `c` repeat count, `m` butterfly count,
// `twCos`/`twSin` the stage's twiddle table (cosine, negated sine).
#pragma once

#include <cstddef>
#include <cstdint>

#include "fft/fft.h"
#include "core/types.h"

constexpr int kFftMaxFactors = 20;
constexpr int kFftMaxRadix = 43;  // kernel tables are indexed 0..kFftMaxRadix

// Complex lengths from this one up run all their leaves in one pass before
// any combining, when they have three or more factors and a kernel leaf
// (fft/transform.cpp, LeafFirst).
constexpr int32_t kFftLeafFirstMin = 16384;

// Forward real transforms of even lengths from this one up run on the complex
// plan of half the length; shorter and odd ones on the real kernels, which
// are faster there. The inverse takes the half-length plan at every even
// length (through the real kernels it would cost two more passes).
constexpr int32_t kFftRealByHalfMin = 1024;

// Factor kinds.
constexpr int32_t kFftKindKernel = 0;   // specialised straight-line kernel
constexpr int32_t kFftKindGeneric = 1;  // generic odd prime below 50
constexpr int32_t kFftKindRader = 2;    // prime of 50 or more, by Rader's method

// for t = 0..c-1: DFT of inputs t*li + q*ls, q = 0..r-1, to outputs t*lo + q*os
// (the recursion's leaves: li = is, ls = c*is, lo = r*os).
using FftComplexLeafFn = void (*)(const double* inRe, const double* inIm, double* outRe,
                                  double* outIm, ptrdiff_t li, ptrdiff_t ls, ptrdiff_t lo,
                                  ptrdiff_t os, ptrdiff_t c);
// In place, for k = 0..m-1 on legs (k + j*m)*os: twiddle legs j >= 1 of
// butterflies k >= 1, then a DFT of size r. The kernels read the grouped
// table (FftStage::twGrouped, its sines at twCos + 4; twSin is not used), the
// prime passes entry (k-1)*(r-1) + (j-1) of twCos and twSin.
using FftComplexTwiddleFn = void (*)(double* re, double* im, const double* twCos,
                                     const double* twSin, ptrdiff_t os, ptrdiff_t m);
// Real-input DFTs of size r written in packed half-complex order.
using FftRealLeafFn = void (*)(const double* in, double* out, ptrdiff_t is, ptrdiff_t os,
                               ptrdiff_t c);
// Combining pass over r packed half-complex sub-transforms of length m.
using FftRealTwiddleFn = void (*)(double* data, const double* twCos, const double* twSin,
                                  ptrdiff_t os, ptrdiff_t m);

// One stage per factor, zero-filled at creation.
struct FftStage {
  double* primeCos;  // kind 1: cos(2 pi k/r), k = 0..r-1
  double* primeSin;  // kind 1: -sin(2 pi k/r)
  // All but the last stage, except kernel stages of even n >= kFftRealByHalfMin:
  // (r-1)*(m-1) twiddles at (k-1)*(r-1) + (j-1).
  double* twCos;
  double* twSin;
  // Kernel stages but the last: the grouped table of the complex combining
  // kernels. Butterflies k = 4g..4g+3 form group g of 8*(r-1) doubles; leg j's
  // four cosines start at 8*(j-1) and its four sines 4 doubles later, with
  // butterfly 4g + i at place 0, 2, 1, 3 for i = 0..3 (the lane order of the
  // four-lane interleaved loads). Butterfly 0 and those past m - 1 hold (1, 0).
  double* twGrouped;
  FftPlan* raderPlan;     // kind 2: plan of length r-1
  double* raderKernelRe;  // kind 2: transformed convolution kernel, r-1 values
  double* raderKernelIm;
  int32_t* raderIndex;         // kind 2: 0, 1, g^(r-2), ..., g (mod r)
  int32_t* raderInverseIndex;  // kind 2: 0, 1, g, ..., g^(r-2) (mod r)
};

struct FftPlan {
  int32_t n;
  int32_t refCount;
  int32_t factor[kFftMaxFactors];
  int32_t kind[kFftMaxFactors];
  int32_t factorCount;
  FftStage* stage[kFftMaxFactors];
  FftRealLeafFn realLeaf[kFftMaxFactors];
  FftRealTwiddleFn realTwiddle[kFftMaxFactors];
  FftComplexLeafFn complexLeaf[kFftMaxFactors];
  FftComplexTwiddleFn complexTwiddle[kFftMaxFactors];
  FftPlan* prev;
  FftPlan* next;
  // Real transforms of even n: the shared plan of length n/2 and the twiddles
  // cos(2 pi k/n), -sin(2 pi k/n), k = 0..n/4, made on first use and read
  // through FftRealHalf (null until then).
  FftPlan* half;
  double* halfCos;
  double* halfSin;
};

// Generated radix-indexed kernel tables (kernel_table.cpp, written at build
// time by tools/gen_fft_kernels.py); null entries for radices without a
// specialised kernel.
extern const FftComplexLeafFn kFftComplexLeaf[kFftMaxRadix + 1];
extern const FftComplexTwiddleFn kFftComplexTwiddle[kFftMaxRadix + 1];
extern const FftRealLeafFn kFftRealLeaf[kFftMaxRadix + 1];
extern const FftRealTwiddleFn kFftRealTwiddle[kFftMaxRadix + 1];

// Plan list internals: the caller already holds the plan mutex.
FftPlan* FftPlanAcquireLocked(int32_t n);
void FftPlanReleaseLocked(FftPlan* plan);

// The half-length plan of an even-length plan (its twiddles filled in),
// made under the plan mutex the first time it is asked for; null when memory
// ran out. Thread-safe; the plan keeps it until its last release.
FftPlan* FftRealHalf(const FftPlan* plan);

// Factorisation of n (n >= 2) into ascending factors with their kinds; returns
// the factor count (0 for n = 1).
int32_t FftFactorize(int32_t n, int32_t* factor, int32_t* kind);

// ---- generic odd-prime and Rader passes (fft/prime_kernels.cpp) ---------------
// Leaf forms: c transforms as FftComplexLeafFn / FftRealLeafFn. Combining forms:
// in place as FftComplexTwiddleFn / FftRealTwiddleFn. -20001 when the per-call
// scratch cannot be allocated.
[[nodiscard]] StatusCode FftGenericLeafComplex(const FftStage* st, int32_t r, const double* inRe,
                                               const double* inIm, double* outRe, double* outIm,
                                               ptrdiff_t is, ptrdiff_t os, ptrdiff_t c);
[[nodiscard]] StatusCode FftGenericTwiddleComplex(const FftStage* st, int32_t r, double* re,
                                                  double* im, const double* twCos,
                                                  const double* twSin, ptrdiff_t os, ptrdiff_t m);
[[nodiscard]] StatusCode FftGenericLeafReal(const FftStage* st, int32_t r, const double* in,
                                            double* out, ptrdiff_t is, ptrdiff_t os, ptrdiff_t c);
[[nodiscard]] StatusCode FftGenericTwiddleReal(const FftStage* st, int32_t r, double* data,
                                               const double* twCos, const double* twSin,
                                               ptrdiff_t os, ptrdiff_t m);
[[nodiscard]] StatusCode FftRaderLeafComplex(const FftStage* st, int32_t r, const double* inRe,
                                             const double* inIm, double* outRe, double* outIm,
                                             ptrdiff_t is, ptrdiff_t os, ptrdiff_t c);
[[nodiscard]] StatusCode FftRaderTwiddleComplex(const FftStage* st, int32_t r, double* re,
                                                double* im, const double* twCos,
                                                const double* twSin, ptrdiff_t os, ptrdiff_t m);
[[nodiscard]] StatusCode FftRaderLeafReal(const FftStage* st, int32_t r, const double* in,
                                          double* out, ptrdiff_t is, ptrdiff_t os, ptrdiff_t c);
[[nodiscard]] StatusCode FftRaderTwiddleReal(const FftStage* st, int32_t r, double* data,
                                             const double* twCos, const double* twSin, ptrdiff_t os,
                                             ptrdiff_t m);
