// Principal-component AR: forward-backward linear prediction solved through a
// pseudo-inverse truncated to the k strongest singular components of the data
// matrix, then the roots of the AR polynomial.
//
// Data matrix A (2q x p, q = n - p), forward block over backward block:
//   forward  row i      A = x[i+p-1-j], b = x[i+p]
//   backward row q + i  A = x[i+1+j],   b = x[i]    (conjugated for complex data)
#include <cmath>
#include <cstddef>
#include <cstring>
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
// strict "s > tau" test of the pseudo-inverse, unless singular values tie at k.
// The singular values come from the eigenvalues of the Gram matrix of A's
// smaller side, which is much cheaper than an SVD of the tall data matrix.
template <typename T>
StatusCode PcarThreshold(const T* A, int32_t rows, int32_t cols, int32_t k, double* tau) {
  const int32_t mn = rows < cols ? rows : cols;
  const size_t cells = static_cast<size_t>(rows) * static_cast<size_t>(cols);
  auto adjoint = AllocWork<T>(cells);
  auto gram = AllocWork<T>(static_cast<size_t>(mn) * static_cast<size_t>(mn));
  auto lambda = AllocWork<double>(static_cast<size_t>(mn));
  auto descending = AllocWork<double>(static_cast<size_t>(mn));
  auto eig = AllocWork<Complex>(kIsComplex<T> ? static_cast<size_t>(mn) : 0);
  if (!adjoint || !gram || !lambda || !descending || !eig) return status::kNoMemory;

  // The adjoint is written to its own buffer; A itself is only read.
  StatusCode st = AdjointInto(const_cast<T*>(A), rows, cols, adjoint.get());
  if (st != status::kOk) return st;
  if (rows > cols) {
    st = MatMul(adjoint.get(), A, cols, rows, cols, gram.get());  // A^H A, p x p
  } else {
    st = MatMul(A, adjoint.get(), rows, cols, rows, gram.get());  // A A^H, 2q x 2q
  }
  if (st != status::kOk) return st;

  if constexpr (kIsComplex<T>) {
    // Hermitian solver: real eigenvalues returned as (w, 0).
    st = EigComplex(gram.get(), mn, 1, 0, eig.get(), nullptr);
    if (st != status::kOk) return st;
    // The modulus by hypot: the eigenvalues carry the square of the data's
    // scale, so re * re would overflow for data of magnitude 1e90 (or vanish
    // for 1e-90) and move the threshold to infinity (or 0). Where the squares
    // stay in range the two agree exactly, the imaginary parts being zero.
    for (int32_t i = 0; i < mn; ++i) lambda[i] = std::hypot(eig[i].real(), eig[i].imag());
  } else {
    st = EigSymReal(gram.get(), mn, 0, lambda.get(), nullptr);
    if (st != status::kOk) return st;
    for (int32_t i = 0; i < mn; ++i) lambda[i] = std::fabs(lambda[i]);
  }

  // Ascending sort (NaN first), then reversed: lambda_1 >= lambda_2 >= ...
  st = SortReal(lambda.get(), mn, 0, nullptr);
  if (st != status::kOk) return st;
  st = ReverseReal(lambda.get(), descending.get(), mn);
  if (st != status::kOk) return st;

  if (k == mn) {
    *tau = std::sqrt(descending[k - 1]) * 0.5;
  } else if (k < mn) {
    *tau = (std::sqrt(descending[k - 1]) + std::sqrt(descending[k])) * 0.5;
  } else {
    *tau = 0.0;
  }
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
  auto A = AllocWork<T>(2 * block);
  auto b = AllocWork<T>(static_cast<size_t>(rows));
  auto fwdA = AllocWork<T>(block);
  auto fwdB = AllocWork<T>(static_cast<size_t>(q));
  auto bwdA = AllocWork<T>(block);
  auto bwdB = AllocWork<T>(static_cast<size_t>(q));
  auto w = AllocWork<T>(static_cast<size_t>(p));
  auto poly = AllocWork<T>(static_cast<size_t>(p) + 1);
  auto polyC = AllocWork<Complex>(kIsComplex<T> ? 0 : static_cast<size_t>(p) + 1);
  if (!A || !b || !fwdA || !fwdB || !bwdA || !bwdB || !w || !poly || !polyC) {
    return status::kNoMemory;
  }

  StatusCode st = BuildForward(x, n, p, fwdB.get(), fwdA.get());
  if (st != status::kOk) return st;
  st = BuildBackward(x, n, p, bwdB.get(), bwdA.get());
  if (st != status::kOk) return st;
  if constexpr (kIsComplex<T>) {
    // Complex data: the backward equations predict conj(x[i]) from conj(x[i+1..]),
    // so the whole backward block and its right-hand side are conjugated.
    for (size_t i = 0; i < block; ++i) bwdA[i] = std::conj(bwdA[i]);
    for (int32_t i = 0; i < q; ++i) bwdB[i] = std::conj(bwdB[i]);
  }
  std::memcpy(A.get(), fwdA.get(), block * sizeof(T));
  std::memcpy(A.get() + block, bwdA.get(), block * sizeof(T));
  std::memcpy(b.get(), fwdB.get(), static_cast<size_t>(q) * sizeof(T));
  std::memcpy(b.get() + q, bwdB.get(), static_cast<size_t>(q) * sizeof(T));

  double tau = 0.0;
  st = PcarThreshold(A.get(), rows, p, k, &tau);
  if (st != status::kOk) return st;

  // P = pinv(A) truncated at tau, p x 2q, over A; w = P b.
  st = PseudoInverse(A.get(), rows, p, tau);
  if (st != status::kOk) return st;
  st = MatMul(A.get(), b.get(), p, rows, 1, w.get());
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
