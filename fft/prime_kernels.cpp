// Prime factors without a specialised kernel: the generic odd-prime DFT
// (O(r^2) on symmetric pairs, for 23 and 47) and Rader's method (primes of 53
// and above: a cyclic convolution of length r-1 done with the stage's
// sub-plan). Each kernel call allocates its scratch once, never per butterfly.
//
// Legend: x/y inputs and outputs (re/im at a stride), r the prime, h = (r-1)/2,
// c repeat count, m butterfly count, wc/ws twiddles (cosine, negated sine).

#include "fft/plan.h"
#include "numeric/work.h"

namespace {

// ---- generic odd prime ------------------------------------------------------------
// One DFT of size r. Legs j >= 1 are multiplied by (wc[j-1] + i ws[j-1]) when
// wc is non-null. y may equal x (in place): every input is read into the
// scratch (4h values) before the first output is written.
void GenericDft(const FftStage* st, int32_t r, const double* xr, const double* xi, ptrdiff_t is,
                double* yr, double* yi, ptrdiff_t os, const double* wc, const double* ws,
                double* scratch) {
  const int32_t h = (r - 1) / 2;
  double* sr = scratch;
  double* si = sr + h;
  double* dr = si + h;
  double* di = dr + h;
  const double x0r = xr[0], x0i = xi[0];
  double sum_r = x0r, sum_i = x0i;
  for (int32_t j = 1; j <= h; ++j) {
    double ar = xr[j * is], ai = xi[j * is];
    double br = xr[(r - j) * is], bi = xi[(r - j) * is];
    if (wc != nullptr) {
      const double c1 = wc[j - 1], s1 = ws[j - 1], c2 = wc[r - j - 1], s2 = ws[r - j - 1];
      const double tr = ar * c1 - ai * s1, ur = br * c2 - bi * s2;
      ai = ai * c1 + ar * s1;
      bi = bi * c2 + br * s2;
      ar = tr;
      br = ur;
    }
    sr[j - 1] = ar + br;
    si[j - 1] = ai + bi;
    dr[j - 1] = ar - br;
    di[j - 1] = ai - bi;
    sum_r += sr[j - 1];
    sum_i += si[j - 1];
  }
  const double* pc = st->primeCos;
  const double* ps = st->primeSin;  // -sin
  for (int32_t q = 1; q <= h; ++q) {
    double ar = x0r, ai = x0i, br = 0.0, bi = 0.0;
    int32_t k = 0;
    for (int32_t j = 0; j < h; ++j) {
      k += q;
      if (k >= r) k -= r;
      ar += sr[j] * pc[k];
      ai += si[j] * pc[k];
      br += di[j] * ps[k];
      bi += dr[j] * ps[k];
    }
    yr[q * os] = ar - br;
    yi[q * os] = ai + bi;
    yr[(r - q) * os] = ar + br;
    yi[(r - q) * os] = ai - bi;
  }
  yr[0] = sum_r;
  yi[0] = sum_i;
}

// ---- Rader ------------------------------------------------------------------------
// One DFT of prime size r through a cyclic convolution of length r-1:
// b_q = x[g^q], X[g^-p] = x0 + (b * h)_p with h_t = exp(-2 pi i g^-t / r).
// The convolution is conj(DFT(conj(DFT(b) . H))) with H = DFT(h)/(r-1), so both
// transforms are forward ones on the sub-plan. The scratch (2(r-1) values)
// holds b interleaved (re, im), so that interleaved data runs the sub-plan's
// paired-load kernels throughout. Output legs 1..r-1 serve as the second
// buffer, so y must not overlap the scratch; y may equal x. Legs j >= 1 are
// twiddled by (wc[j-1] + i ws[j-1]) when wc is non-null.
StatusCode RaderDft(const FftStage* st, int32_t r, const double* xr, const double* xi, ptrdiff_t is,
                    double* yr, double* yi, ptrdiff_t os, const double* wc, const double* ws,
                    double* scratch) {
  const int32_t len = r - 1;
  double* br = scratch;  // interleaved: element q at 2q
  double* bi = scratch + 1;
  const int32_t* gather = st->raderInverseIndex + 1;  // g^q
  const int32_t* scatter = st->raderIndex + 1;        // g^-p
  const double x0r = xr[0], x0i = xi[0];
  for (int32_t q = 0; q < len; ++q) {
    const int32_t j = gather[q];
    double ar = xr[j * is], ai = xi[j * is];
    if (wc != nullptr) {
      const double c = wc[j - 1], s = ws[j - 1];
      const double tr = ar * c - ai * s;
      ai = ai * c + ar * s;
      ar = tr;
    }
    br[2 * q] = ar;
    bi[2 * q] = ai;
  }
  double* cr = yr + os;  // legs 1..r-1 as the transform buffer
  double* ci = yi + os;
  // Legs 1..r-1 lie inside the transform, whose length and strides are int32:
  // so does their stride, the sub-plan's.
  const auto legStride = static_cast<int32_t>(os);
  StatusCode status = FftComplex(st->raderPlan, br, bi, cr, ci, 2, legStride, len);
  if (status < 0) return status;
  const double sum_r = x0r + cr[0], sum_i = x0i + ci[0];  // bin 0 is the sum of the b_q
  const double* kr = st->raderKernelRe;
  const double* ki = st->raderKernelIm;
  for (int32_t p = 0; p < len; ++p) {
    const double ur = cr[p * os], ui = ci[p * os];
    cr[p * os] = ur * kr[p] - ui * ki[p];
    ci[p * os] = -(ur * ki[p] + ui * kr[p]);  // conjugate of the product
  }
  status = FftComplex(st->raderPlan, cr, ci, br, bi, legStride, 2, len);
  if (status < 0) return status;
  for (int32_t p = 0; p < len; ++p) {
    const ptrdiff_t k = scatter[p];
    yr[k * os] = x0r + br[2 * p];
    yi[k * os] = x0i - bi[2 * p];
  }
  yr[0] = sum_r;
  yi[0] = sum_i;
  return status::kOk;
}

// ---- real-input passes on top of a complex DFT of size r ----------------------------
// `Dft(zr, zi, yr, yi, scratch)` transforms r interleaved complex values.

// Per-call work of the real prime passes: the complex input z and output y
// of one r-point DFT, interleaved (element q at 2q), then the inner kernel's
// own scratch.
struct RealPassScratch {
  WorkArray<double> work;
  double *zr = nullptr, *zi = nullptr, *yr = nullptr, *yi = nullptr, *scratch = nullptr;
  RealPassScratch(int32_t r, size_t scratch_count)
      : work(AllocWork<double>(4 * static_cast<size_t>(r) + scratch_count)) {
    if (!work) return;
    zr = work.get();
    zi = zr + 1;
    yr = zr + 2 * r;
    yi = yr + 1;
    scratch = zr + 4 * r;
  }
};

// Real leaf: c transforms of r reals each, written in packed half-complex order.
// Two real sequences a, b run as one complex DFT Z of z = a + i b, split by
// A[k] = (Z[k] + conj Z[r-k]) / 2 and B[k] = (Z[k] - conj Z[r-k]) / 2i; an
// odd last one runs alone with a zero imaginary part.
template <typename DftFn>
StatusCode RealLeaf(int32_t r, const double* in, double* out, ptrdiff_t is, ptrdiff_t os,
                    ptrdiff_t c, size_t scratch_count, DftFn dft) {
  RealPassScratch ws(r, scratch_count);
  if (!ws.work) return status::kNoMemory;
  double* zr = ws.zr;
  double* zi = ws.zi;
  double* yr = ws.yr;
  double* yi = ws.yi;
  double* scratch = ws.scratch;
  const ptrdiff_t xs = c * is;
  ptrdiff_t t = 0;
  for (; t + 1 < c; t += 2) {
    const double* xa = in + t * is;
    const double* xb = xa + is;
    for (int32_t q = 0; q < r; ++q) {
      zr[2 * q] = xa[q * xs];
      zi[2 * q] = xb[q * xs];
    }
    const StatusCode st = dft(zr, zi, yr, yi, scratch);
    if (st < 0) return st;
    double* ya = out + t * r * os;
    double* yb = ya + r * os;
    ya[0] = yr[0];
    yb[0] = yi[0];
    for (int32_t q = 1; 2 * q < r; ++q) {
      const double ar = yr[2 * q], ai = yi[2 * q];
      const double br = yr[2 * (r - q)], bi = yi[2 * (r - q)];
      ya[q * os] = 0.5 * (ar + br);
      ya[(r - q) * os] = 0.5 * (ai - bi);
      yb[q * os] = 0.5 * (ai + bi);
      yb[(r - q) * os] = 0.5 * (br - ar);
    }
  }
  for (; t < c; ++t) {
    for (int32_t q = 0; q < r; ++q) {
      zr[2 * q] = in[t * is + q * xs];
      zi[2 * q] = 0.0;
    }
    const StatusCode st = dft(zr, zi, yr, yi, scratch);
    if (st < 0) return st;
    double* y = out + t * r * os;
    y[0] = yr[0];
    for (int32_t q = 1; 2 * q < r; ++q) {
      y[q * os] = yr[2 * q];
      y[(r - q) * os] = yi[2 * q];
    }
  }
  return status::kOk;
}

// Real combining pass over r packed sub-transforms of length m. Group k pairs
// Y_j[k] (Re at (j*m + k), Im at (j*m + m - k)); its r outputs X[k + m q] go
// back to the same 2r places: below the middle as (Re, Im) at (q*m + k,
// (r-1-q)*m + m - k), above it conjugated with the places swapped. Group 0 is
// a real DFT, group m/2 (even m) a DFT of real values twiddled by exp(-i pi j/r).
template <typename DftFn>
StatusCode RealTwiddle(int32_t r, double* data, const double* twCos, const double* twSin,
                       ptrdiff_t os, ptrdiff_t m, size_t scratch_count, DftFn dft) {
  RealPassScratch ws(r, scratch_count);
  if (!ws.work) return status::kNoMemory;
  double* zr = ws.zr;
  double* zi = ws.zi;
  double* yr = ws.yr;
  double* yi = ws.yi;
  double* scratch = ws.scratch;
  const ptrdiff_t s = m * os;
  // group 0
  for (int32_t j = 0; j < r; ++j) {
    zr[2 * j] = data[j * s];
    zi[2 * j] = 0.0;
  }
  StatusCode st = dft(zr, zi, yr, yi, scratch);
  if (st < 0) return st;
  data[0] = yr[0];
  for (int32_t q = 1; 2 * q < r; ++q) {
    data[q * s] = yr[2 * q];
    data[(r - q) * s] = yi[2 * q];
  }
  for (ptrdiff_t k = 1; 2 * k <= m; ++k) {
    const double* wc = twCos + (k - 1) * (r - 1);
    const double* wsin = twSin + (k - 1) * (r - 1);
    double* a = data + k * os;
    double* b = data + (m - k) * os;
    const bool middle = 2 * k == m;  // Y_j[m/2] is real
    for (int32_t j = 0; j < r; ++j) {
      const double re = a[j * s];
      const double im = middle ? 0.0 : b[j * s];
      if (j == 0) {
        zr[0] = re;
        zi[0] = im;
      } else {
        zr[2 * j] = re * wc[j - 1] - im * wsin[j - 1];
        zi[2 * j] = im * wc[j - 1] + re * wsin[j - 1];
      }
    }
    st = dft(zr, zi, yr, yi, scratch);
    if (st < 0) return st;
    if (middle) {
      for (int32_t q = 0; 2 * q + 1 <= r; ++q) {
        a[q * s] = yr[2 * q];
        if (2 * q + 1 < r) a[(r - 1 - q) * s] = yi[2 * q];
      }
    } else {
      for (int32_t q = 0; q < r; ++q) {
        if (2 * q < r) {
          a[q * s] = yr[2 * q];
          b[(r - 1 - q) * s] = yi[2 * q];
        } else {
          b[(r - 1 - q) * s] = yr[2 * q];
          a[q * s] = -yi[2 * q];
        }
      }
    }
  }
  return status::kOk;
}

}  // namespace

// ---- generic odd prime -------------------------------------------------------------
StatusCode FftGenericLeafComplex(const FftStage* st, int32_t r, const double* inRe,
                                 const double* inIm, double* outRe, double* outIm, ptrdiff_t is,
                                 ptrdiff_t os, ptrdiff_t c) {
  WorkArray<double> scratch = AllocWork<double>(2 * static_cast<size_t>(r));
  if (!scratch) return status::kNoMemory;
  for (ptrdiff_t t = 0; t < c; ++t) {
    GenericDft(st, r, inRe + t * is, inIm + t * is, c * is, outRe + t * r * os, outIm + t * r * os,
               os, nullptr, nullptr, scratch.get());
  }
  return status::kOk;
}

StatusCode FftGenericTwiddleComplex(const FftStage* st, int32_t r, double* re, double* im,
                                    const double* twCos, const double* twSin, ptrdiff_t os,
                                    ptrdiff_t m) {
  WorkArray<double> scratch = AllocWork<double>(2 * static_cast<size_t>(r));
  if (!scratch) return status::kNoMemory;
  const ptrdiff_t s = m * os;
  GenericDft(st, r, re, im, s, re, im, s, nullptr, nullptr, scratch.get());
  for (ptrdiff_t k = 1; k < m; ++k) {
    GenericDft(st, r, re + k * os, im + k * os, s, re + k * os, im + k * os, s,
               twCos + (k - 1) * (r - 1), twSin + (k - 1) * (r - 1), scratch.get());
  }
  return status::kOk;
}

StatusCode FftGenericLeafReal(const FftStage* st, int32_t r, const double* in, double* out,
                              ptrdiff_t is, ptrdiff_t os, ptrdiff_t c) {
  // Real input: Re X_q = x0 + sum s_j cos, Im X_q = sum d_j (-sin).
  WorkArray<double> scratch = AllocWork<double>(2 * static_cast<size_t>(r));
  if (!scratch) return status::kNoMemory;
  const int32_t h = (r - 1) / 2;
  double* sum = scratch.get();
  double* dif = sum + h;
  for (ptrdiff_t t = 0; t < c; ++t) {
    const double* x = in + t * is;
    const ptrdiff_t xs = c * is;
    double* y = out + t * r * os;
    const double x0 = x[0];
    double total = x0;
    for (int32_t j = 1; j <= h; ++j) {
      sum[j - 1] = x[j * xs] + x[(r - j) * xs];
      dif[j - 1] = x[j * xs] - x[(r - j) * xs];
      total += sum[j - 1];
    }
    for (int32_t q = 1; q <= h; ++q) {
      double re = x0, im = 0.0;
      int32_t k = 0;
      for (int32_t j = 0; j < h; ++j) {
        k += q;
        if (k >= r) k -= r;
        re += sum[j] * st->primeCos[k];
        im += dif[j] * st->primeSin[k];
      }
      y[q * os] = re;
      y[(r - q) * os] = im;
    }
    y[0] = total;
  }
  return status::kOk;
}

StatusCode FftGenericTwiddleReal(const FftStage* st, int32_t r, double* data, const double* twCos,
                                 const double* twSin, ptrdiff_t os, ptrdiff_t m) {
  return RealTwiddle(
      r, data, twCos, twSin, os, m, 2 * static_cast<size_t>(r),
      [st, r](const double* zr, const double* zi, double* yr, double* yi, double* scratch) {
        GenericDft(st, r, zr, zi, 2, yr, yi, 2, nullptr, nullptr, scratch);
        return status::kOk;
      });
}

// ---- Rader --------------------------------------------------------------------------
StatusCode FftRaderLeafComplex(const FftStage* st, int32_t r, const double* inRe,
                               const double* inIm, double* outRe, double* outIm, ptrdiff_t is,
                               ptrdiff_t os, ptrdiff_t c) {
  WorkArray<double> scratch = AllocWork<double>(2 * static_cast<size_t>(r - 1));
  if (!scratch) return status::kNoMemory;
  for (ptrdiff_t t = 0; t < c; ++t) {
    const StatusCode status =
        RaderDft(st, r, inRe + t * is, inIm + t * is, c * is, outRe + t * r * os,
                 outIm + t * r * os, os, nullptr, nullptr, scratch.get());
    if (status < 0) return status;
  }
  return status::kOk;
}

StatusCode FftRaderTwiddleComplex(const FftStage* st, int32_t r, double* re, double* im,
                                  const double* twCos, const double* twSin, ptrdiff_t os,
                                  ptrdiff_t m) {
  WorkArray<double> scratch = AllocWork<double>(2 * static_cast<size_t>(r - 1));
  if (!scratch) return status::kNoMemory;
  const ptrdiff_t s = m * os;
  for (ptrdiff_t k = 0; k < m; ++k) {
    const double* wc = k == 0 ? nullptr : twCos + (k - 1) * (r - 1);
    const double* ws = k == 0 ? nullptr : twSin + (k - 1) * (r - 1);
    const StatusCode status = RaderDft(st, r, re + k * os, im + k * os, s, re + k * os, im + k * os,
                                       s, wc, ws, scratch.get());
    if (status < 0) return status;
  }
  return status::kOk;
}

StatusCode FftRaderLeafReal(const FftStage* st, int32_t r, const double* in, double* out,
                            ptrdiff_t is, ptrdiff_t os, ptrdiff_t c) {
  return RealLeaf(
      r, in, out, is, os, c, 2 * static_cast<size_t>(r - 1),
      [st, r](const double* zr, const double* zi, double* yr, double* yi, double* scratch) {
        return RaderDft(st, r, zr, zi, 2, yr, yi, 2, nullptr, nullptr, scratch);
      });
}

StatusCode FftRaderTwiddleReal(const FftStage* st, int32_t r, double* data, const double* twCos,
                               const double* twSin, ptrdiff_t os, ptrdiff_t m) {
  return RealTwiddle(
      r, data, twCos, twSin, os, m, 2 * static_cast<size_t>(r - 1),
      [st, r](const double* zr, const double* zi, double* yr, double* yi, double* scratch) {
        return RaderDft(st, r, zr, zi, 2, yr, yi, 2, nullptr, nullptr, scratch);
      });
}
