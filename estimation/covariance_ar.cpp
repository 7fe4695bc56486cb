// Covariance-method AR estimation: forward linear prediction over the samples
// that have all p predecessors (no windowing, no zero extension), solved in the
// least-squares sense. Returns a[0..p] with a[0] = 1 and a[k] = -w[k-1], the
// poles (roots of z^p + a[1] z^(p-1) + ... + a[p]) and the mean squared
// prediction error over the M = n - p equations.
#include <cassert>
#include <cstddef>

#include "core/scalar.h"
#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

// Iteration limits per root handed to the root finder. The complex estimator
// deliberately allows twenty times more than the real one.
constexpr int32_t kRootIterationsReal = 1000;
constexpr int32_t kRootIterationsComplex = 20000;

}  // namespace

template <typename T>
StatusCode CovarianceAr(const T* x, int32_t n, int32_t p, T* a, Complex* r, double* variance) {
  assert(checks::Covariance(n, p, checks::Bound::kWide) == status::kOk);

  const int32_t M = n - p;
  const size_t rows = static_cast<size_t>(M);
  const size_t cols = static_cast<size_t>(p);
  const size_t terms = cols + 1;

  WorkArray<T> w = AllocWork<T>(cols);
  if (!w) return status::kNoMemory;
  WorkArray<T> Aw = AllocWorkUninit<T>(rows);
  if (!Aw) return status::kNoMemory;
  WorkArray<T> e = AllocWorkUninit<T>(rows);
  if (!e) return status::kNoMemory;
  // Root-finder input: the real estimator reverses into a real vector and
  // widens it; the complex one reverses straight into the complex vector.
  WorkArray<double> reversed;
  if constexpr (!kIsComplex<T>) {
    reversed = AllocWork<double>(terms);
    if (!reversed) return status::kNoMemory;
  }
  WorkArray<Complex> c = AllocWork<Complex>(terms);
  if (!c) return status::kNoMemory;

  // The forward prediction system: A[i][j] = x[i+p-1-j], b[i] = x[i+p]. The
  // solve's status is deliberately not examined: a rank-deficient (or failed)
  // solve goes on with whatever w holds. rcond -1 selects machine precision.
  // The real solve is the minimum-norm driver, the complex one the
  // pseudo-inverse solve.
  (void)ForwardLeastSquares(x, n, p, w.get(), -1.0);

  // The coefficients are the caller's from here on, even if a later step fails.
  a[0] = T(1.0);
  for (size_t k = 0; k < cols; ++k) a[k + 1] = -w[k];

  StatusCode st = HankelProduct(x, M, p, w.get(), 1, Aw.get());
  if (st != status::kOk) return st;
  st = VecSub(Aw.get(), x + p, M, e.get());
  if (st != status::kOk) return st;

  double sum = 0.0;
  if constexpr (kIsComplex<T>) {
    // Real parts, then imaginary parts, each gathered into a real vector and
    // squared-summed by the dot product. A.w is no longer needed, and its M
    // complex elements hold exactly the 2M doubles of the two gathers.
    double* gather = reinterpret_cast<double*>(Aw.get());
    double* re = gather;
    double* im = gather + rows;
    for (size_t i = 0; i < rows; ++i) {
      re[i] = e[i].real();
      im[i] = e[i].imag();
    }
    double sum_re = 0.0;
    double sum_im = 0.0;
    st = DotReal(re, re, M, &sum_re);
    if (st != status::kOk) return st;
    st = DotReal(im, im, M, &sum_im);
    if (st != status::kOk) return st;
    sum = sum_re + sum_im;
  } else {
    st = DotReal(e.get(), e.get(), M, &sum);
    if (st != status::kOk) return st;
  }
  *variance = sum / static_cast<double>(M);

  // c[k] = a[p-k]: the constant term first, as the root finder wants it.
  int32_t iteration_limit = 0;
  if constexpr (kIsComplex<T>) {
    (void)Reverse(a, c.get(), p + 1);
    iteration_limit = kRootIterationsComplex;
  } else {
    (void)Reverse(a, reversed.get(), p + 1);
    for (size_t k = 0; k < terms; ++k) c[k] = Complex(reversed[k], 0.0);
    iteration_limit = kRootIterationsReal;
  }
  return PolyRootsComplex(c.get(), p + 1, iteration_limit, r);
}
template StatusCode CovarianceAr(const double*, int32_t, int32_t, double*, Complex*, double*);
template StatusCode CovarianceAr(const Complex*, int32_t, int32_t, Complex*, Complex*, double*);

StatusCode CovarianceArReal(const double* x, int32_t n, int32_t p, double* a, Complex* r,
                            double* variance) {
  return CovarianceAr(x, n, p, a, r, variance);
}
StatusCode CovarianceArComplex(const Complex* x, int32_t n, int32_t p, Complex* a, Complex* r,
                               double* variance) {
  return CovarianceAr(x, n, p, a, r, variance);
}
