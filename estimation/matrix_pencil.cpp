// Matrix pencil: poles of a sum of M damped exponentials as the eigenvalues of
// the pencil Y1^+ Y2 reduced to Y1's M strongest singular components.
//
// Y1 (q x L, q = n - L): Y1[i][j] = x[i+L-1-j]   (row i: samples i..i+L-1, newest first)
// Y2 (q x L):            Y2[i][j] = x[i+L-j]     (Y1 advanced by one sample)
// With Y1 = U diag(s) V^H (r = min(q, L) components), the reduced pencil is
//   K = diag(1/s) U^H Y2 V   (r x r),
// whose eigenvalues are the signal poles when Y1 has rank >= M.
#include <algorithm>
#include <cassert>
#include <cmath>
#include <complex>
#include <cstddef>
#include <cstring>

#include "core/scalar.h"
#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/krylov.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

// ---- reduced pencil ---------------------------------------------------------------------
// Only the leading mr x mr block of K is ever used (mr = min(M, r)), and each of
// its elements depends only on the first mr singular triplets, so only those
// are computed and only that block is formed: K_M = diag(1/s_M) U_M^H Y2 V_M.
//
// A tall Y1 (q >= 2L) is never formed. Its R of Y1 = QR (L x L) has Y1's
// singular values and right singular vectors, and both Y1 and Y2 are row
// windows of the (q+1) x L Hankel H[i][j] = x[i+L-1-j]: with Z = H V_M,
// Y1 V_M = Z[0:q] = U_M diag(s_M) and Y2 V_M = Z[1:q+1], so
//   K_M = diag(1/s_M) diag(1/s_M) Z[0:q]^H Z[1:q+1].
// Otherwise Y1 and Y2 are built and Y1's leading triplets taken directly.
//
// The Krylov route (long records) forms neither: Y1's leading triplets come
// from a Lanczos bidiagonalization whose products with Y1 are FFT
// convolutions with x, and Z = H V_M is one more such product, so time is
// O(n log n) per product and memory O(n M).
enum class Route { kDense, kKrylov };

template <typename T>
StatusCode PencilMatrixKrylov(const T* x, int32_t q, int32_t L, int32_t mr, T* full) {
  auto U = AllocWorkUninit<T>(static_cast<size_t>(q) * static_cast<size_t>(mr));
  auto s = AllocWorkUninit<double>(static_cast<size_t>(mr));
  auto V = AllocWorkUninit<T>(static_cast<size_t>(L) * static_cast<size_t>(mr));
  auto last = AllocWorkUninit<T>(static_cast<size_t>(mr));
  if (!U || !s || !V || !last) return status::kNoMemory;
  StatusCode st = HankelSvdLeading(x, q, L, mr, s.get(), U.get(), V.get());
  if (st != status::kOk) return st;
  // Y2 V_M is Y1 V_M = U_M diag(s_M) moved up one row, with one new last row
  // x[n-1-j] V_M (Y2's last row holds x[n-1] .. x[q]): so
  //   K_M = diag(1/s) (U_M[0:q-1]^H U_M[1:q] diag(s) + conj(U_M[q-1])^T last).
  const T* y2last = x + q;  // Y2[q-1][j] = x[q+L-1-j]
  for (int32_t b = 0; b < mr; ++b) {
    T sum = T(0.0);
    for (int32_t j = 0; j < L; ++j) sum += y2last[L - 1 - j] * V[size_t(j) * mr + b];
    last[b] = sum;
  }
  st = AdjointMatMul(U.get(), U.get() + mr, q - 1, mr, mr, full);
  if (st != status::kOk) return st;
  const T* uq = U.get() + size_t(q - 1) * mr;
  for (int32_t a = 0; a < mr; ++a) {
    for (int32_t b = 0; b < mr; ++b) {
      full[size_t(a) * mr + b] = full[size_t(a) * mr + b] * s[b] + Conj(uq[a]) * last[b];
    }
  }
  return ScaleRowsByInverse(full, mr, mr, s.get());
}

template <typename T>
StatusCode ReducedPencil(const T* x, int32_t n, int32_t L, int32_t M, T* K, Route route) {
  const int32_t q = n - L;
  const int32_t r = q < L ? q : L;
  const int32_t mr = M < r ? M : r;
  if (route == Route::kKrylov) {
    auto full = AllocWorkUninit<T>(static_cast<size_t>(mr) * static_cast<size_t>(mr));
    if (!full) return status::kNoMemory;
    const StatusCode st = PencilMatrixKrylov(x, q, L, mr, full.get());
    if (st != status::kOk) return st;
    std::memcpy(static_cast<void*>(K), full.get(),
                static_cast<size_t>(mr) * static_cast<size_t>(mr) * sizeof(T));
    return status::kOk;
  }
  const bool tall = int64_t{q} >= 2 * int64_t{L};
  const size_t qL = tall ? 0 : static_cast<size_t>(q) * static_cast<size_t>(L);
  const size_t LL = tall ? static_cast<size_t>(L) * static_cast<size_t>(L) : 0;
  const size_t zq = static_cast<size_t>(tall ? q + 1 : q) * static_cast<size_t>(mr);
  auto y1 = AllocWorkUninit<T>(qL);
  auto y2 = AllocWorkUninit<T>(qL);
  auto rhs = AllocWorkUninit<T>(tall ? 0 : static_cast<size_t>(q));
  auto R = AllocWorkUninit<T>(LL);
  auto U = AllocWorkUninit<T>(zq);  // U, or Z = H V for a tall Y1
  auto s = AllocWorkUninit<double>(static_cast<size_t>(mr));
  auto V = AllocWorkUninit<T>(static_cast<size_t>(L) * static_cast<size_t>(mr));
  auto Uh = AllocWorkUninit<T>(static_cast<size_t>(mr) * static_cast<size_t>(q));
  auto T1 = AllocWorkUninit<T>(tall ? 0 : static_cast<size_t>(mr) * static_cast<size_t>(L));
  auto full = AllocWorkUninit<T>(static_cast<size_t>(mr) * static_cast<size_t>(mr));
  if (!y1 || !y2 || !rhs || !R || !U || !s || !V || !Uh || !T1 || !full) {
    return status::kNoMemory;
  }

  StatusCode st = status::kOk;
  if (tall) {
    st = QrReduceHankel(x, q, L, R.get());
    if (st != status::kOk) return st;
    st = SvdLeadingRight(R.get(), L, L, mr, s.get(), V.get());
    if (st != status::kOk) return st;
    st = HankelProduct(x, q + 1, L, V.get(), mr, U.get());
    if (st != status::kOk) return st;
    // Z[0:q]^H Z[1:q+1], then each row by 1/s_i twice, unguarded: a zero
    // singular value yields infinities.
    st = Adjoint(U.get(), q, mr, Uh.get());
    if (st != status::kOk) return st;
    st = MatMul(Uh.get(), U.get() + mr, mr, q, mr, full.get());
    if (st != status::kOk) return st;
    st = ScaleRowsByInverse(full.get(), mr, mr, s.get());
    if (st != status::kOk) return st;
    st = ScaleRowsByInverse(full.get(), mr, mr, s.get());
    if (st != status::kOk) return st;
  } else {
    // Y1 is the forward prediction block; Y2 is Y1 advanced by one sample.
    st = BuildForwardMatrix(x, n, L, rhs.get(), y1.get());
    if (st != status::kOk) return st;
    for (int32_t i = 0; i < q; ++i) {
      T* row = y2.get() + static_cast<size_t>(i) * static_cast<size_t>(L);
      for (int32_t j = 0; j < L; ++j) row[j] = x[i + L - j];
    }
    st = SvdLeading(y1.get(), q, L, mr, U.get(), s.get(), V.get());
    if (st != status::kOk) return st;
    st = Adjoint(U.get(), q, mr, Uh.get());
    if (st != status::kOk) return st;
    // diag(1/s) U^H, unguarded: a zero singular value yields infinities.
    st = ScaleRowsByInverse(Uh.get(), mr, q, s.get());
    if (st != status::kOk) return st;
    st = MatMul(Uh.get(), y2.get(), mr, q, L, T1.get());
    if (st != status::kOk) return st;
    st = MatMul(T1.get(), V.get(), mr, L, mr, full.get());
    if (st != status::kOk) return st;
  }

  // The leading M x M block, or with fewer components than modes the whole
  // r x r matrix: mr x mr either way, row stride mr.
  std::memcpy(static_cast<void*>(K), full.get(),
              static_cast<size_t>(mr) * static_cast<size_t>(mr) * sizeof(T));
  return status::kOk;
}

// ---- estimator ------------------------------------------------------------------------------
template <typename T>
StatusCode MatrixPencil(const T* x, int32_t n, int32_t L, int32_t M, double fs, int32_t realFlag,
                        double* amp, double* phase, double* damp, double* freq, int32_t* count,
                        double* mse, Route route = Route::kDense) {
  assert(checks::Pencil(n, L, M, fs, checks::Bound::kWide) == status::kOk);

  const int32_t q = n - L;
  int32_t order = q < L ? q : L;
  if (M < order) order = M;
  auto K = AllocWork<T>(static_cast<size_t>(M) * static_cast<size_t>(M));
  auto poles = AllocWork<Complex>(static_cast<size_t>(order));
  auto amplitudes = AllocWork<Complex>(static_cast<size_t>(order));
  if (!K || !poles || !amplitudes) return status::kNoMemory;

  StatusCode st = ReducedPencil(x, n, L, M, K.get(), route);
  if (st != status::kOk) return st;
  st = EigGeneral(K.get(), order, 0, poles.get(), static_cast<Complex*>(nullptr));
  if (st != status::kOk) return st;
  st = ModeAmplitudes(x, n, poles.get(), order, amplitudes.get(), mse);
  if (st != status::kOk) return st;
  return ModeParameters(amplitudes.get(), order, poles.get(), order, fs, realFlag, amp, phase, damp,
                        freq, count);
}

}  // namespace

// Row i times 1/s[i], with no threshold.
template <typename T>
StatusCode ScaleRowsByInverse(T* A, int32_t rows, int32_t cols, const double* s) {
  for (int32_t i = 0; i < rows; ++i) {
    T* row = A + static_cast<size_t>(i) * static_cast<size_t>(cols);
    if constexpr (kIsComplex<T>) {
      // Reciprocal of s_i + 0i by Smith's division, then a plain complex product
      // (no special handling of infinite or NaN parts): spelled out on purpose,
      // as std::complex's division and product would recover NaN parts.
      double fr = 0.0, fi = 0.0;
      (void)ComplexDivide(1.0, 0.0, s[i], 0.0, &fr, &fi);
      for (int32_t j = 0; j < cols; ++j) {
        const double ar = row[j].real(), ai = row[j].imag();
        row[j] = Complex(ar * fr - ai * fi, ar * fi + ai * fr);
      }
    } else {
      const double f = 1.0 / s[i];
      for (int32_t j = 0; j < cols; ++j) row[j] *= f;
    }
  }
  return status::kOk;
}

template StatusCode ScaleRowsByInverse(double*, int32_t, int32_t, const double*);
template StatusCode ScaleRowsByInverse(Complex*, int32_t, int32_t, const double*);

template <typename T>
StatusCode PencilMatrix(const T* x, int32_t n, int32_t L, int32_t M, T* K) {
  return ReducedPencil(x, n, L, M, K, Route::kDense);
}
template StatusCode PencilMatrix(const double*, int32_t, int32_t, int32_t, double*);
template StatusCode PencilMatrix(const Complex*, int32_t, int32_t, int32_t, Complex*);

StatusCode PencilMatrixReal(const double* x, int32_t n, int32_t L, int32_t M, double* K) {
  return PencilMatrix(x, n, L, M, K);
}
StatusCode PencilMatrixComplex(const Complex* x, int32_t n, int32_t L, int32_t M, Complex* K) {
  return PencilMatrix(x, n, L, M, K);
}
StatusCode MatrixPencilReal(const double* x, int32_t n, int32_t L, int32_t M, double fs,
                            int32_t realFlag, double* amp, double* phase, double* damp,
                            double* freq, int32_t* count, double* mse) {
  return MatrixPencil<double>(x, n, L, M, fs, realFlag, amp, phase, damp, freq, count, mse);
}
// Complex data have no conjugate pairs to fold: every mode is reported (flag 0).
StatusCode MatrixPencilComplex(const Complex* x, int32_t n, int32_t L, int32_t M, double fs,
                               double* amp, double* phase, double* damp, double* freq,
                               int32_t* count, double* mse) {
  return MatrixPencil<Complex>(x, n, L, M, fs, 0, amp, phase, damp, freq, count, mse);
}
// Measured on one core with OpenBLAS: the dense route spends about 3e-10 s
// (real) or 7.5e-10 s (complex) per q L^2, the Krylov route about 1e-8 s per
// k N log2 N (k Lanczos vectors, N the FFT length), for either data type.
bool PencilPrefersKrylov(int32_t n, int32_t L, int32_t M, bool complex) {
  if (L < 1 || L >= n || int64_t{4} * M > L) return false;
  const double q = static_cast<double>(n - L);
  const double N = static_cast<double>(n);
  const double k = std::max(2.0 * M + 8.0, M + 16.0);
  const double dense = (complex ? 7.5e-10 : 3e-10) * q * static_cast<double>(L) * L;
  const double krylov = 1e-8 * k * N * std::log2(N);
  return 2.0 * krylov < dense;
}

namespace {
Route RouteOf(PencilSolver solver, int32_t n, int32_t L, int32_t M, bool complex) {
  if (solver == PencilSolver::kKrylov) return Route::kKrylov;
  if (solver == PencilSolver::kAuto && PencilPrefersKrylov(n, L, M, complex)) {
    return Route::kKrylov;
  }
  return Route::kDense;
}
}  // namespace

StatusCode MatrixPencilSolverReal(const double* x, int32_t n, int32_t L, int32_t M, double fs,
                                  int32_t realFlag, PencilSolver solver, double* amp, double* phase,
                                  double* damp, double* freq, int32_t* count, double* mse) {
  return MatrixPencil<double>(x, n, L, M, fs, realFlag, amp, phase, damp, freq, count, mse,
                              RouteOf(solver, n, L, M, false));
}
StatusCode MatrixPencilSolverComplex(const Complex* x, int32_t n, int32_t L, int32_t M, double fs,
                                     PencilSolver solver, double* amp, double* phase, double* damp,
                                     double* freq, int32_t* count, double* mse) {
  return MatrixPencil<Complex>(x, n, L, M, fs, 0, amp, phase, damp, freq, count, mse,
                               RouteOf(solver, n, L, M, true));
}
