// Principal-component AR: forward-backward linear prediction solved through a
// pseudo-inverse truncated to the k strongest singular components of the data
// matrix (applied, never formed), then the roots of the AR polynomial.
//
// Data matrix A (2q x p, q = n - p), forward block over backward block:
//   forward  row i      A = x[i+p-1-j], b = x[i+p]
//   backward row q + i  A = x[i+1+j],   b = x[i]    (conjugated for complex data)
#include <cmath>
#include <cstddef>
#include <type_traits>

#include "estimation/estimation.h"
#include "estimation/twins.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

using namespace twin;

// ---- truncation threshold -----------------------------------------------------------------
// tau lies halfway between the k-th and (k+1)-th singular values of A (half the
// k-th when k is the last one), so exactly the k strongest components survive the
// strict "s > tau" test, unless singular values tie at k. The estimator itself
// takes tau inside its solve, from the same factorization.
template <typename T>
StatusCode PcarThreshold(const T* A, int32_t rows, int32_t cols, int32_t k, double* tau) {
  const int32_t mn = rows < cols ? rows : cols;
  auto u = AllocWorkUninit<T>(static_cast<size_t>(rows) * static_cast<size_t>(mn));
  auto v = AllocWorkUninit<T>(static_cast<size_t>(cols) * static_cast<size_t>(mn));
  auto s = AllocWorkUninit<double>(static_cast<size_t>(mn));
  if (!u || !v || !s) return status::kNoMemory;
  const StatusCode st = Svd(A, rows, cols, u.get(), s.get(), v.get());
  if (st != status::kOk) return st;
  *tau = TruncationThreshold(s.get(), mn, k);
  return status::kOk;
}

// ---- estimator ------------------------------------------------------------------------------
template <typename T>
StatusCode PcarEstimate(const T* x, int32_t n, int32_t p, int32_t k, T* a, Complex* roots) {
  if (n < 1) return status::kEmptyInput;
  if (p < 0 || p > MaxOrder(n)) return status::kBadOrder;
  if (k < 1) return status::kBadCount;
  if (k > p) return status::kCountAboveOrder;

  const int32_t q = n - p;
  const int32_t rows = 2 * q;
  const size_t block = static_cast<size_t>(q) * static_cast<size_t>(p);
  auto A = AllocWorkUninit<T>(2 * block);
  auto b = AllocWorkUninit<T>(static_cast<size_t>(rows));
  auto w = AllocWorkUninit<T>(static_cast<size_t>(p));
  auto poly = AllocWorkUninit<T>(static_cast<size_t>(p) + 1);
  auto polyC = AllocWorkUninit<Complex>(kIsComplex<T> ? 0 : static_cast<size_t>(p) + 1);
  if (!A || !b || !w || !poly || !polyC) return status::kNoMemory;

  // The two blocks are built in place, forward rows first.
  StatusCode st = BuildForward(x, n, p, b.get(), A.get());
  if (st != status::kOk) return st;
  st = BuildBackward(x, n, p, b.get() + q, A.get() + block);
  if (st != status::kOk) return st;
  if constexpr (kIsComplex<T>) {
    // Complex data: the backward equations predict conj(x[i]) from conj(x[i+1..]),
    // so the whole backward block and its right-hand side are conjugated.
    for (size_t i = block; i < 2 * block; ++i) A[i] = std::conj(A[i]);
    for (int32_t i = q; i < rows; ++i) b[i] = std::conj(b[i]);
  }

  // w = pinv(A) b over the k strongest singular components of A.
  st = TruncatedSolve(A.get(), rows, p, b.get(), w.get(), k);
  if (st != status::kOk) return st;

  a[0] = T(1.0);
  for (int32_t j = 1; j <= p; ++j) a[j] = -w[j - 1];

  // Roots of z^p + a[1] z^(p-1) + ... + a[p]: the root finder reads ascending powers.
  const Complex* coeffs = nullptr;
  if constexpr (kIsComplex<T>) {
    st = ReverseComplex(a, poly.get(), p + 1);
    coeffs = poly.get();
  } else {
    st = ReverseReal(a, poly.get(), p + 1);
    for (int32_t i = 0; i <= p; ++i) polyC[i] = Complex(poly[i], 0.0);
    coeffs = polyC.get();
  }
  if (st != status::kOk) return st;
  return PolyRootsComplex(coeffs, p + 1, 1000, roots);
}

}  // namespace

StatusCode PcarThresholdReal(const double* A, int32_t rows, int32_t cols, int32_t k,
                             double* tau) {
  return PcarThreshold<double>(A, rows, cols, k, tau);
}
StatusCode PcarThresholdComplex(const Complex* A, int32_t rows, int32_t cols, int32_t k,
                                double* tau) {
  return PcarThreshold<Complex>(A, rows, cols, k, tau);
}
StatusCode PcarEstimateReal(const double* x, int32_t n, int32_t p, int32_t k, double* a,
                            Complex* roots) {
  return PcarEstimate<double>(x, n, p, k, a, roots);
}
StatusCode PcarEstimateComplex(const Complex* x, int32_t n, int32_t p, int32_t k, Complex* a,
                               Complex* roots) {
  return PcarEstimate<Complex>(x, n, p, k, a, roots);
}
