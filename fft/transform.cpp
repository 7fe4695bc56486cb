// Transform drivers: recursive mixed-radix decimation in time over a plan's
// ascending factors. The first (smallest) factor is the outermost decimation,
// the largest one the leaf transform; each stage combines its r sub-transforms
// of length m in place on the output. Complex and real input share the
// recursion and differ only in the kernels they call.

#include "fft/plan.h"

namespace {

// The leaf transforms of stage L, repeated c times.
template <bool kReal>
StatusCode Leaf(const FftPlan* p, int32_t L, const double* inRe, const double* inIm, double* outRe,
                double* outIm, ptrdiff_t is, ptrdiff_t os, ptrdiff_t c) {
  const int32_t r = p->factor[L];
  const FftStage* st = p->stage[L];
  if constexpr (kReal) {  // real input: one packed sequence, no imaginary parts
    switch (p->kind[L]) {
      case kFftKindKernel:
        p->realLeaf[L](inRe, outRe, is, os, c);
        return status::kOk;
      case kFftKindGeneric:
        return FftGenericLeafReal(st, r, inRe, outRe, is, os, c);
      default:
        return FftRaderLeafReal(st, r, inRe, outRe, is, os, c);
    }
  } else {
    switch (p->kind[L]) {
      case kFftKindKernel:
        p->complexLeaf[L](inRe, inIm, outRe, outIm, is, os, c);
        return status::kOk;
      case kFftKindGeneric:
        return FftGenericLeafComplex(st, r, inRe, inIm, outRe, outIm, is, os, c);
      default:
        return FftRaderLeafComplex(st, r, inRe, inIm, outRe, outIm, is, os, c);
    }
  }
}

// The combining pass of stage s over m butterflies, in place.
template <bool kReal>
StatusCode Combine(const FftPlan* p, int32_t s, double* re, double* im, ptrdiff_t os,
                   ptrdiff_t m) {
  const int32_t r = p->factor[s];
  const FftStage* st = p->stage[s];
  if constexpr (kReal) {
    switch (p->kind[s]) {
      case kFftKindKernel:
        p->realTwiddle[s](re, st->twCos, st->twSin, os, m);
        return status::kOk;
      case kFftKindGeneric:
        return FftGenericTwiddleReal(st, r, re, st->twCos, st->twSin, os, m);
      default:
        return FftRaderTwiddleReal(st, r, re, st->twCos, st->twSin, os, m);
    }
  } else {
    switch (p->kind[s]) {
      case kFftKindKernel:
        p->complexTwiddle[s](re, im, st->twCos, st->twSin, os, m);
        return status::kOk;
      case kFftKindGeneric:
        return FftGenericTwiddleComplex(st, r, re, im, st->twCos, st->twSin, os, m);
      default:
        return FftRaderTwiddleComplex(st, r, re, im, st->twCos, st->twSin, os, m);
    }
  }
}

// Stage s of current length len = r*m: sub-transforms of the r decimated
// input sequences into consecutive blocks of m outputs, then the combining pass.
template <bool kReal>
StatusCode Stage(const FftPlan* p, int32_t s, const double* inRe, const double* inIm,
                 double* outRe, double* outIm, ptrdiff_t is, ptrdiff_t os, ptrdiff_t len) {
  const int32_t r = p->factor[s];
  const ptrdiff_t m = len / r;
  StatusCode st = status::kOk;
  if (s == p->factorCount - 2) {
    st = Leaf<kReal>(p, s + 1, inRe, inIm, outRe, outIm, is, os, r);
    if (st < 0) return st;
  } else {
    for (int32_t j = 0; j < r; ++j) {
      st = Stage<kReal>(p, s + 1, inRe + j * is, kReal ? nullptr : inIm + j * is,
                        outRe + j * m * os, kReal ? nullptr : outIm + j * m * os, r * is, os, m);
      if (st < 0) return st;
    }
  }
  return Combine<kReal>(p, s, outRe, outIm, os, m);
}

template <bool kReal>
StatusCode Run(const FftPlan* p, const double* inRe, const double* inIm, double* outRe,
               double* outIm, ptrdiff_t is, ptrdiff_t os) {
  if (p->n == 1) {
    outRe[0] = inRe[0];
    if constexpr (!kReal) outIm[0] = inIm[0];
    return status::kOk;
  }
  if (p->factorCount == 1) return Leaf<kReal>(p, 0, inRe, inIm, outRe, outIm, is, os, 1);
  return Stage<kReal>(p, 0, inRe, inIm, outRe, outIm, is, os, p->n);
}

}  // namespace

StatusCode FftComplex(const FftPlan* plan, const double* inRe, const double* inIm, double* outRe,
                      double* outIm, int32_t inStride, int32_t outStride, int32_t n) {
  if (plan == nullptr || n != plan->n) return status::kFftLengthMismatch;
  return Run<false>(plan, inRe, inIm, outRe, outIm, inStride, outStride);
}

StatusCode FftReal(const FftPlan* plan, const double* in, double* out, int32_t inStride,
                   int32_t outStride, int32_t n) {
  if (plan == nullptr || n != plan->n) return status::kFftRealLengthMismatch;
  return Run<true>(plan, in, nullptr, out, nullptr, inStride, outStride);
}
