// FFT engine: forward DFTs of any length by mixed-radix decimation in time,
// and the inverse of the real one, on plans shared per length in a
// process-wide list.
#pragma once

#include <cstdint>

#include "core/types.h"

struct FftPlan;  // fft/plan.h

// Shared plan for length n (reference count raised), or null when n < 1 or
// memory ran out. Thread-safe.
FftPlan* FftPlanAcquire(int32_t n);
// Drops one reference; the last one frees the plan. Null is allowed.
void FftPlanRelease(FftPlan* plan);

// Forward complex DFT X[k] = sum_j x[j] exp(-2 pi i jk/n), unnormalised, on
// separate real/imaginary sequences with strides counted in doubles
// (interleaved data: base, base + 1, stride 2). Input and output must not
// overlap. -1 when n differs from the plan's length.
[[nodiscard]] StatusCode FftComplex(const FftPlan* plan, const double* inRe, const double* inIm,
                                    double* outRe, double* outIm, int32_t inStride,
                                    int32_t outStride, int32_t n);
// Forward DFT of a real sequence in packed half-complex order: out[0] = Re X0,
// out[k] = Re Xk, out[n-k] = Im Xk (1 <= k < n/2), out[n/2] = Re X(n/2) for
// even n. -20999 when n differs from the plan's length.
[[nodiscard]] StatusCode FftReal(const FftPlan* plan, const double* in, double* out,
                                 int32_t inStride, int32_t outStride, int32_t n);
// Inverse of FftReal, unnormalised: from X in FftReal's packed half-complex
// order (Im X0 and, for even n, Im X(n/2) taken as 0) to the real sequence
// x[j] = sum_k X[k] exp(+2 pi i jk/n) = n times the sequence FftReal took.
// Input and output must not overlap. -20999 when n differs from the plan's
// length; -20001 when work memory ran out.
[[nodiscard]] StatusCode FftHalfComplexToReal(const FftPlan* plan, const double* in, double* out,
                                              int32_t inStride, int32_t outStride, int32_t n);
// x replaced by |X[k]|^2 / n^2, k = 0..n-1 (two-sided).
[[nodiscard]] StatusCode PowerSpectrumReal(double* x, int32_t n);
// Multiplies x by the periodic cosine-sum window of the given kind (0..9, 11).
[[nodiscard]] StatusCode ApplyWindow(double* x, int32_t n, int32_t kind, int32_t flag);
