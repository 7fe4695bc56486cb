// Transform drivers: recursive mixed-radix decimation in time over a plan's
// factors, ascending but for long transforms whose smallest factor is below 4
// (CreatePlan moves a large one first). The first factor is the outermost
// decimation, the last (largest) one the leaf transform; each stage combines its r sub-transforms
// of length m in place on the output. Long complex transforms run all their
// leaves first (LeafFirst). Real transforms of even length run on the complex
// plan of half the length (RealByHalf and its inverse); odd ones share the
// recursion with the complex driver and differ only in the kernels they call.

#include <cstring>

#include "fft/kernel_access.h"
#include "fft/plan.h"
#include "numeric/work.h"

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
        p->complexLeaf[L](inRe, inIm, outRe, outIm, is, c * is, r * os, os, c);
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
StatusCode Combine(const FftPlan* p, int32_t s, double* re, double* im, ptrdiff_t os, ptrdiff_t m) {
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
        p->complexTwiddle[s](re, im, st->twGrouped, st->twGrouped + 4, os, m);
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
StatusCode Stage(const FftPlan* p, int32_t s, const double* inRe, const double* inIm, double* outRe,
                 double* outIm, ptrdiff_t is, ptrdiff_t os, ptrdiff_t len) {
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

// The combining passes of the recursion below stage s, on leaves already done.
StatusCode CombineTree(const FftPlan* p, int32_t s, double* re, double* im, ptrdiff_t os,
                       ptrdiff_t len) {
  const ptrdiff_t m = len / p->factor[s];
  if (s + 2 < p->factorCount) {
    for (int32_t j = 0; j < p->factor[s]; ++j) {
      const StatusCode st = CombineTree(p, s + 1, re + j * m * os, im + j * m * os, os, m);
      if (st < 0) return st;
    }
  }
  return Combine<false>(p, s, re, im, os, m);
}

// Complex transform whose leaves all run first, in input order: the leaf of
// decimation path (j0, ..., j(L-1)) reads x[B + q n/rL], q = 0..rL-1, with
// B = j0 + r0 (j1 + r1 (j2 + ...)), and writes its place in the recursion's
// output, j0 n/r0 + j1 n/(r0 r1) + ... + j(L-1) rL. One kernel call takes
// the r0 leaves of consecutive B, so four-lane groups read whole cache lines
// and the rL input streams run forward; the recursion's own order would read
// them at the largest strides, a line per leg, and again for each j0.
StatusCode LeafFirst(const FftPlan* p, const double* inRe, const double* inIm, double* outRe,
                     double* outIm, ptrdiff_t is, ptrdiff_t os) {
  const int32_t last = p->factorCount - 1;
  const ptrdiff_t n = p->n;
  const ptrdiff_t r0 = p->factor[0];
  const ptrdiff_t rl = p->factor[last];
  const ptrdiff_t ls = (n / rl) * is;
  const ptrdiff_t lo = (n / r0) * os;
  ptrdiff_t weight[kFftMaxFactors];  // output step of digit s, in elements
  int32_t digit[kFftMaxFactors] = {};
  ptrdiff_t span = n / r0;
  for (int32_t s = 1; s < last; ++s) {
    span /= p->factor[s];
    weight[s] = span;
  }
  const ptrdiff_t blocks = n / (r0 * rl);
  ptrdiff_t place = 0;
  for (ptrdiff_t b = 0; b < blocks; ++b) {
    const ptrdiff_t at = b * r0 * is;
    p->complexLeaf[last](inRe + at, inIm + at, outRe + place * os, outIm + place * os, is, ls, lo,
                         os, r0);
    for (int32_t s = 1; s < last; ++s) {  // next block: count up the digits j1, j2, ...
      place += weight[s];
      if (++digit[s] < p->factor[s]) break;
      place -= weight[s] * p->factor[s];
      digit[s] = 0;
    }
  }
  return CombineTree(p, 0, outRe, outIm, os, n);
}

template <bool kReal>
StatusCode Run(const FftPlan* p, const double* inRe, const double* inIm, double* outRe,
               double* outIm, ptrdiff_t is, ptrdiff_t os) {
  if constexpr (!kReal) {
    if (p->n >= kFftLeafFirstMin && p->factorCount >= 3 &&
        p->kind[p->factorCount - 1] == kFftKindKernel)
      return LeafFirst(p, inRe, inIm, outRe, outIm, is, os);
  }
  if (p->n == 1) {
    outRe[0] = inRe[0];
    if constexpr (!kReal) outIm[0] = inIm[0];
    return status::kOk;
  }
  if (p->factorCount == 1) return Leaf<kReal>(p, 0, inRe, inIm, outRe, outIm, is, os, 1);
  return Stage<kReal>(p, 0, inRe, inIm, outRe, outIm, is, os, p->n);
}

using fftk::V2;
V2 Load2(const double* p) {
  V2 v;
  std::memcpy(&v, p, sizeof v);
  return v;
}
void Store2(double* p, V2 v) { std::memcpy(p, &v, sizeof v); }
V2 Swap(V2 v) { return __builtin_shufflevector(v, v, 1, 0); }

// RealByHalf's pass from Z to the packed X. With unit output stride, k and
// k + 1 run together in the two lanes of a vector (the same operations, so
// the same results as one at a time).
template <bool kUnit>
void SplitHalves(const double* z, double* out, ptrdiff_t os, ptrdiff_t n, const double* wc,
                 const double* ws) {
  if constexpr (kUnit) os = 1;
  const ptrdiff_t h = n / 2;
  out[0] = z[0] + z[1];
  out[h * os] = z[0] - z[1];
  ptrdiff_t k = 1;
  if constexpr (kUnit) {
    const V2 half = {0.5, 0.5};
    for (; 2 * (k + 1) < h; k += 2) {
      const V2 p0 = Load2(z + 2 * k), p1 = Load2(z + 2 * k + 2);
      const V2 q0 = Load2(z + 2 * (h - k)), q1 = Load2(z + 2 * (h - k) - 2);
      const V2 a = __builtin_shufflevector(p0, p1, 0, 2), b = __builtin_shufflevector(p0, p1, 1, 3);
      const V2 c = __builtin_shufflevector(q0, q1, 0, 2), d = __builtin_shufflevector(q0, q1, 1, 3);
      const V2 er = half * (a + c), ei = half * (b - d);
      const V2 orr = half * (b + d), oi = half * (c - a);
      const V2 w = Load2(wc + k), v = Load2(ws + k);
      const V2 tr = w * orr - v * oi;
      const V2 ti = w * oi + v * orr;
      Store2(out + k, er + tr);
      Store2(out + n - k - 1, Swap(ei + ti));
      Store2(out + h - k - 1, Swap(er - tr));
      Store2(out + h + k, ti - ei);
    }
  }
  for (; 2 * k < h; ++k) {
    const double a = z[2 * k], b = z[2 * k + 1];
    const double c = z[2 * (h - k)], d = z[2 * (h - k) + 1];
    const double er = 0.5 * (a + c), ei = 0.5 * (b - d);
    const double orr = 0.5 * (b + d), oi = 0.5 * (c - a);
    const double tr = wc[k] * orr - ws[k] * oi;
    const double ti = wc[k] * oi + ws[k] * orr;
    out[k * os] = er + tr;
    out[(n - k) * os] = ei + ti;
    out[(h - k) * os] = er - tr;
    out[(h + k) * os] = ti - ei;
  }
  if (h % 2 == 0) {  // X_(h/2) = conj Z_(h/2): W^(h/2) = -i
    out[(h / 2) * os] = z[h];
    out[(n - h / 2) * os] = -z[h + 1];
  }
}

// The inverse's pass from the packed X to the stored Z' (kUnit: is is 1).
template <bool kUnit>
void MergeHalves(const double* in, double* y, ptrdiff_t is, ptrdiff_t n, const double* wc,
                 const double* ws) {
  if constexpr (kUnit) is = 1;
  const ptrdiff_t h = n / 2;
  const double x0 = in[0], xh = in[h * is];
  y[0] = x0 + xh;
  y[1] = x0 - xh;
  ptrdiff_t k = 1;
  if constexpr (kUnit) {  // k and k + 1 in the two lanes, as in SplitHalves
    for (; 2 * (k + 1) < h; k += 2) {
      const V2 pr = Load2(in + k), pi = Swap(Load2(in + n - k - 1));
      const V2 ur = Swap(Load2(in + h - k - 1)), ui = Load2(in + h + k);
      const V2 ar = pr + ur, ai = pi - ui;
      const V2 br = pr - ur, bi = pi + ui;
      const V2 w = Load2(wc + k), v = Load2(ws + k);
      const V2 orr = br * w + bi * v;
      const V2 oi = bi * w - br * v;
      const V2 zr = ar - oi, zi = ai + orr;
      Store2(y + 2 * (h - k), __builtin_shufflevector(zr, zi, 0, 2));
      Store2(y + 2 * (h - k) - 2, __builtin_shufflevector(zr, zi, 1, 3));
      const V2 mr = ar + oi, mi = orr - ai;
      Store2(y + 2 * k, __builtin_shufflevector(mr, mi, 0, 2));
      Store2(y + 2 * k + 2, __builtin_shufflevector(mr, mi, 1, 3));
    }
  }
  for (; 2 * k < h; ++k) {
    const double pr = in[k * is], pi = in[(n - k) * is];        // X_k
    const double ur = in[(h - k) * is], ui = in[(h + k) * is];  // X_(h-k)
    const double ar = pr + ur, ai = pi - ui;
    const double br = pr - ur, bi = pi + ui;
    const double orr = br * wc[k] + bi * ws[k];
    const double oi = bi * wc[k] - br * ws[k];
    y[2 * (h - k)] = ar - oi;  // Z'_k
    y[2 * (h - k) + 1] = ai + orr;
    y[2 * k] = ar + oi;  // Z'_(h-k) = conj(2E_k) + i conj(2O_k)
    y[2 * k + 1] = orr - ai;
  }
  if (h % 2 == 0) {  // Z'_(h/2) = 2 conj X_(h/2)
    y[h] = 2.0 * in[(h / 2) * is];
    y[h + 1] = -2.0 * in[(n - h / 2) * is];
  }
}

// Real transform of even n = 2h through the complex one of length h: with
// z_j = x_2j + i x_(2j+1) and Z = DFT_h(z), the transforms of the even and
// odd samples are E_k = (Z_k + conj Z_(h-k))/2 and O_k = (Z_k - conj Z_(h-k))/2i,
// and X_k = E_k + W^k O_k, X_(h-k) = conj(E_k - W^k O_k), W = exp(-2 pi i/n).
StatusCode RealByHalf(const FftPlan* p, const double* in, double* out, ptrdiff_t is, ptrdiff_t os) {
  const FftPlan* half = FftRealHalf(p);
  const ptrdiff_t n = p->n;
  WorkArray<double> work = AllocWorkUninit<double>(static_cast<size_t>(n));
  if (half == nullptr || !work) return status::kNoMemory;
  double* z = work.get();
  const StatusCode st = Run<false>(half, in, in + is, z, z + 1, 2 * is, 2);
  if (st < 0) return st;
  if (os == 1) {
    SplitHalves<true>(z, out, 1, n, p->halfCos, p->halfSin);
  } else {
    SplitHalves<false>(z, out, os, n, p->halfCos, p->halfSin);
  }
  return status::kOk;
}

// Inverse of RealByHalf: Z'_k = 2E_k + 2i O_k is formed from the packed X
// (2E_k = X_k + conj X_(h-k), 2O_k = (X_k - conj X_(h-k)) conj W^k), stored
// at index (h-k) mod h, so that the forward DFT of the stored sequence is the
// unnormalised inverse of Z', n (x_2j + i x_(2j+1)).
StatusCode HalfComplexToRealByHalf(const FftPlan* p, const double* in, double* out, ptrdiff_t is,
                                   ptrdiff_t os) {
  const FftPlan* half = FftRealHalf(p);
  const ptrdiff_t n = p->n;
  WorkArray<double> work = AllocWorkUninit<double>(static_cast<size_t>(n));
  if (half == nullptr || !work) return status::kNoMemory;
  double* y = work.get();
  if (is == 1) {
    MergeHalves<true>(in, y, 1, n, p->halfCos, p->halfSin);
  } else {
    MergeHalves<false>(in, y, is, n, p->halfCos, p->halfSin);
  }
  return Run<false>(half, y, y + 1, out, out + os, 2, 2 * os);
}

// Inverse of odd n through the forward real transform: with u_k = Re X_k -
// Im X_k over the whole Hermitian X (u_(n-k) = Re X_k + Im X_k), U = DFT(u)
// has Re U_j = sum Re X_k cos, Im U_j = sum Im X_k sin, so n x_j = Re U_j -
// Im U_j and n x_(n-j) = Re U_j + Im U_j.
StatusCode HalfComplexToRealByHartley(const FftPlan* p, const double* in, double* out, ptrdiff_t is,
                                      ptrdiff_t os) {
  const ptrdiff_t n = p->n;
  WorkArray<double> work = AllocWorkUninit<double>(static_cast<size_t>(n));
  if (!work) return status::kNoMemory;
  double* u = work.get();
  u[0] = in[0];
  for (ptrdiff_t k = 1; 2 * k < n; ++k) {
    const double re = in[k * is], im = in[(n - k) * is];
    u[k] = re - im;
    u[n - k] = re + im;
  }
  if (n % 2 == 0) u[n / 2] = in[(n / 2) * is];
  const StatusCode st = Run<true>(p, u, nullptr, out, nullptr, 1, os);
  if (st < 0) return st;
  for (ptrdiff_t j = 1; 2 * j < n; ++j) {
    const double re = out[j * os], im = out[(n - j) * os];
    out[j * os] = re - im;
    out[(n - j) * os] = re + im;
  }
  return status::kOk;
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
  if (n % 2 == 0 && n >= kFftRealByHalfMin) return RealByHalf(plan, in, out, inStride, outStride);
  return Run<true>(plan, in, nullptr, out, nullptr, inStride, outStride);
}

StatusCode FftHalfComplexToReal(const FftPlan* plan, const double* in, double* out,
                                int32_t inStride, int32_t outStride, int32_t n) {
  if (plan == nullptr || n != plan->n) return status::kFftRealLengthMismatch;
  if (n == 1) {
    out[0] = in[0];
    return status::kOk;
  }
  if (n % 2 == 0) return HalfComplexToRealByHalf(plan, in, out, inStride, outStride);
  return HalfComplexToRealByHartley(plan, in, out, inStride, outStride);
}
