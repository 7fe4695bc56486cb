// Least-squares solves and pseudo-inverses. The real solve runs DGELSD except for
// very wide systems, which go through the SVD pseudo-inverse solve. The
// pseudo-inverse solves apply pinv(A) = V diag(1/S) U^H over the singular values
// above a threshold without forming it, tall systems through a QR factorization
// first; the pseudo-inverses are formed from the economy SVD A = U diag(S) V^H.

#include <algorithm>
#include <cmath>
#include <cstring>
#include <type_traits>

#include "numeric/lapack_boundary.h"
#include "numeric/mat_mul.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

constexpr double kEpsilon = 2.220446049250313e-16;

// Beyond these widths a real system goes to the SVD pseudo-inverse instead of
// DGELSD: one row and more than 739 columns, or more than 66m + 670 + (m-3)(m-2)
// columns for m >= 2 rows.
bool UsesPinvPath(int32_t m, int32_t n) {
  if (m == 1) return n > 739;
  const int64_t mm = m;
  return n > m && n > 66 * mm + 670 + (mm - 3) * (mm - 2);
}

template <typename T>
constexpr bool kIsComplex = !std::is_same_v<T, double>;

template <typename T>
StatusCode SvdOf(const T* A, int32_t m, int32_t n, T* U, double* S, T* V) {
  if constexpr (kIsComplex<T>) {
    return SvdComplex(A, m, n, U, S, V, 0);
  } else {
    return SvdReal(A, m, n, U, S, V, 0);
  }
}

// U (m-by-k) replaced in place by U^T, or U^H for complex (k-by-m).
template <typename T>
StatusCode AdjointInPlace(T* U, int32_t m, int32_t k) {
  if constexpr (kIsComplex<T>) {
    return ConjTransposeComplex(U, m, k, nullptr);
  } else {
    return TransposeReal(U, m, k, nullptr);
  }
}

// Column i of V (n-by-k) scaled by 1/S[i] when S[i] > threshold, else zeroed.
// Returns the number of columns kept. A complex element's parts are both
// multiplied by the same real factor.
template <typename T>
int32_t InvertKeptColumns(T* V, int32_t n, int32_t k, const double* S, double threshold) {
  int32_t kept = 0;
  for (int32_t i = 0; i < k; ++i) {
    const bool keep = S[i] > threshold;
    const double factor = keep ? 1.0 / S[i] : 0.0;
    for (int32_t r = 0; r < n; ++r) {
      T& v = V[int64_t{r} * k + i];
      v = keep ? v * factor : T(0.0);
    }
    kept += keep ? 1 : 0;
  }
  return kept;
}

// Storage of the economy factors: the real twin keeps U, S and V in one block of
// (m + n + 1)k values; the complex twin keeps U and V in one block of (m + n)k
// elements and S in a real block of its own.
template <typename T>
struct Factors {
  WorkArray<T> uv;
  WorkArray<double> s_block;
  T* U = nullptr;
  T* V = nullptr;
  double* S = nullptr;

  bool Allocate(int32_t m, int32_t n, int32_t k) {
    const int64_t mk = int64_t{m} * k;
    const int64_t nk = int64_t{n} * k;
    if constexpr (kIsComplex<T>) {
      uv = AllocWork<T>(static_cast<size_t>(mk + nk));
      if (!uv) return false;
      s_block = AllocWork<double>(static_cast<size_t>(k));
      if (!s_block) return false;
      U = uv.get();
      V = U + mk;
      S = s_block.get();
    } else {
      uv = AllocWork<T>(static_cast<size_t>(mk + k + nk));
      if (!uv) return false;
      U = uv.get();
      S = U + mk;
      V = S + k;
    }
    return true;
  }
};

// P (n-by-m) = V U^H from factors whose V columns are already scaled; U is
// overwritten by its adjoint on the way.
template <typename T>
StatusCode FormPinv(Factors<T>& f, int32_t m, int32_t n, int32_t k, T* P) {
  const StatusCode st = AdjointInPlace(f.U, m, k);
  if (st != status::kOk) return st;
  return MatMul<T>(f.V, f.U, n, k, m, P, false);
}

template <typename T>
int32_t HasNonFinite(const T* x, int64_t n) {
  if constexpr (kIsComplex<T>) {
    return HasNonFiniteComplex(x, n);
  } else {
    return HasNonFiniteReal(x, n);
  }
}

// A system with at least this many rows per column is solved through a QR
// factorization first: the SVD is then taken of the small n-by-n R only.
bool IsTall(int32_t m, int32_t n) { return int64_t{m} >= 2 * int64_t{n}; }

// Which singular values a solve keeps: those above max(m, n) S[0] e (relative),
// or those above the midpoint threshold of TruncationThreshold for `keep`
// components (absolute, no warning).
struct Cut {
  bool relative;
  double e;
  int32_t keep;
};

// X = V diag(1/S) U^H B over the kept singular values of A = U diag(S) V^H. A
// tall A is first factored as A = QR (column-major copy of A, Householder QR,
// Q^H applied to B) and the SVD taken of R = U_R diag(S) V_R^H, whose singular
// values are those of A; then X = V_R diag(1/S) U_R^H (Q^H B)[0:n]. Neither U
// of the tall matrix nor the pseudo-inverse itself is ever formed. *kept is the
// number of singular values kept. nrhs < 1 (possible from the complex solve
// only) factors A for its statuses and writes nothing.
template <typename T>
StatusCode SvdSolve(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs, T* X, Cut cut,
                    int32_t* kept) {
  const int32_t k = std::min(m, n);
  const bool tall = IsTall(m, n) && nrhs > 0;
  const int32_t rows = tall ? n : m;  // rows of the matrix decomposed
  const int64_t mn = int64_t{m} * n;

  Factors<T> f;
  if (!f.Allocate(rows, n, k)) return status::kNoMemory;
  WorkArray<T> qr;
  WorkArray<T> y;
  const T* base = B;  // the right-hand sides U^H is applied to
  StatusCode st = status::kOk;
  if (tall) {
    if (HasNonFinite(A, mn) != 0) return status::kNonFinite;
    // One block: A column-major (lda = m), tau (n), Q^H B column-major
    // (m-by-nrhs) and R (n-by-n); y, the first n rows of Q^H B (n-by-nrhs,
    // row-major), on its own.
    const int64_t mr = int64_t{m} * nrhs;
    const int64_t nn = int64_t{n} * n;
    qr = AllocWorkUninit<T>(static_cast<size_t>(mn + n + mr + nn));
    y = AllocWorkUninit<T>(static_cast<size_t>(int64_t{n} * nrhs));
    if (!qr || !y) return status::kNoMemory;
    T* a_col = qr.get();
    T* tau = a_col + mn;
    T* c = tau + n;
    T* r = c + mr;
    TransposeTo(A, m, n, a_col, false);
    st = lapack::Geqrf(m, n, a_col, m, tau);
    if (st != status::kOk) return st;
    TransposeTo(B, m, nrhs, c, false);
    st = lapack::ApplyQAdjoint(m, nrhs, n, a_col, m, tau, c, m);
    if (st != status::kOk) return st;
    for (int32_t i = 0; i < n; ++i) {
      for (int32_t j = 0; j < n; ++j) r[int64_t{i} * n + j] = j < i ? T(0.0) : a_col[int64_t{j} * m + i];
      for (int32_t j = 0; j < nrhs; ++j) y[int64_t{i} * nrhs + j] = c[int64_t{j} * m + i];
    }
    st = SvdOf(r, n, n, f.U, f.S, f.V);
    base = y.get();
  } else {
    st = SvdOf(A, m, n, f.U, f.S, f.V);
  }
  if (st != status::kOk) return st;

  const double threshold = cut.relative ? std::max(m, n) * f.S[0] * cut.e
                                        : TruncationThreshold(f.S, k, cut.keep);
  int32_t count = 0;
  for (int32_t i = 0; i < k; ++i) count += f.S[i] > threshold ? 1 : 0;
  *kept = count;
  if (nrhs < 1) return nrhs < 0 ? status::kNegativeDim : status::kOk;

  // z = diag(1/S) U^H base (k-by-nrhs), rows of dropped values zero; then V z.
  const int64_t kr = int64_t{k} * nrhs;
  WorkArray<T> z = AllocWorkUninit<T>(static_cast<size_t>(kr + int64_t{n} * nrhs));
  if (!z) return status::kNoMemory;
  lapack::Gemm(k, nrhs, rows, f.U, base, z.get(), true);
  for (int32_t i = 0; i < k; ++i) {
    const bool keep = f.S[i] > threshold;
    const double factor = keep ? 1.0 / f.S[i] : 0.0;
    T* row = z.get() + int64_t{i} * nrhs;
    for (int32_t j = 0; j < nrhs; ++j) row[j] = keep ? row[j] * factor : T(0.0);
  }
  T* solution = z.get() + kr;
  lapack::Gemm(n, nrhs, k, f.V, z.get(), solution);
  std::memcpy(static_cast<void*>(X), solution, static_cast<size_t>(int64_t{n} * nrhs) * sizeof(T));
  return status::kOk;
}

// X = pinv(A) B, with singular values at or below max(m, n) S[0] e dropped,
// e = rcond when positive, machine epsilon otherwise.
template <typename T>
StatusCode PinvSolve(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs, T* X,
                     double rcond) {
  if constexpr (kIsComplex<T>) {
    // Deliberately narrower than the real twin: nrhs is not checked (a negative
    // count gives -20004 once A is factored), and only B is screened here; A
    // is screened by its factorization.
    if (m < 1 || n < 1) return status::kBadSize;
    if (HasNonFiniteComplex(B, int64_t{m} * nrhs) != 0) return status::kNonFinite;
  } else {
    if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
    if (HasNonFiniteReal(A, int64_t{m} * n) != 0 || HasNonFiniteReal(B, int64_t{m} * nrhs) != 0) {
      return status::kNonFinite;
    }
  }
  int32_t kept = 0;
  const StatusCode st =
      SvdSolve(A, m, n, B, nrhs, X, Cut{true, rcond > 0.0 ? rcond : kEpsilon, 0}, &kept);
  if (st != status::kOk) return st;
  return kept == std::min(m, n) ? status::kOk : status::kRankDeficient;
}

template <typename T>
StatusCode TruncatedSolve(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs, T* X,
                          int32_t keep) {
  if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
  if (HasNonFinite(A, int64_t{m} * n) != 0 || HasNonFinite(B, int64_t{m} * nrhs) != 0) {
    return status::kNonFinite;
  }
  int32_t kept = 0;
  return SvdSolve(A, m, n, B, nrhs, X, Cut{false, 0.0, keep}, &kept);
}

// pinv(A) into out, or over A when out is null. tol < 0 selects
// max(m, n) S[0] eps; any other tol (NaN included) is used as given.
template <typename T>
StatusCode PseudoInverse(T* A, int32_t m, int32_t n, double tol, T* out) {
  if (m < 1 || n < 1) return status::kBadSize;
  const int32_t k = std::min(m, n);
  const int64_t mn = int64_t{m} * n;

  Factors<T> f;
  if (!f.Allocate(m, n, k)) return status::kNoMemory;
  WorkArray<T> result = AllocWork<T>(static_cast<size_t>(mn));
  if (!result) return status::kNoMemory;

  StatusCode st = SvdOf(A, m, n, f.U, f.S, f.V);
  if (st != status::kOk) return st;
  if (tol < 0.0) tol = std::max(m, n) * f.S[0] * kEpsilon;
  (void)InvertKeptColumns(f.V, n, k, f.S, tol);
  st = FormPinv(f, m, n, k, result.get());
  if (st != status::kOk) return st;

  T* dst = out != nullptr ? out : A;
  std::memcpy(static_cast<void*>(dst), result.get(), static_cast<size_t>(mn) * sizeof(T));
  return status::kOk;
}

}  // namespace

// ---- DGELSD ------------------------------------------------------------------------

StatusCode LeastSquaresReal(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs,
                            double* X, double rcond) {
  if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
  if (HasNonFiniteReal(A, int64_t{m} * n) != 0 || HasNonFiniteReal(B, int64_t{m} * nrhs) != 0) {
    return status::kNonFinite;
  }
  if (UsesPinvPath(m, n)) return LeastSquaresPinvReal(A, m, n, B, nrhs, X, rcond);

  const int32_t k = std::min(m, n);
  const int32_t ldb = std::max(m, n);

  // Column-major right-hand sides; rows m..ldb-1 of each column are DGELSD's
  // room for the solution of a wide system.
  WorkArray<double> rhs = AllocWorkUninit<double>(static_cast<size_t>(int64_t{ldb} * nrhs));
  if (!rhs) return status::kNoMemory;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(m, B + j, nrhs, rhs.get() + int64_t{j} * ldb, 1);

  // A negative or NaN rcond selects machine epsilon; zero stays zero.
  const double r = rcond >= 0.0 ? rcond : kEpsilon;
  const double lapack_rcond = std::max(m, n) * r;

  // A^T row-major is A column-major with lda = m.
  WorkArray<double> a_col = AllocWorkUninit<double>(static_cast<size_t>(int64_t{m} * n));
  if (!a_col) return status::kNoMemory;
  TransposeTo(A, m, n, a_col.get(), false);
  WorkArray<double> sv = AllocWorkUninit<double>(static_cast<size_t>(k));
  if (!sv) return status::kNoMemory;

  lapack_int rank = 0;
  StatusCode st = lapack::Gelsd(m, n, nrhs, a_col.get(), m, rhs.get(), ldb, sv.get(),
                                lapack_rcond, &rank);
  if (st != status::kOk) return st;

  st = rank < k ? status::kRankDeficient : status::kOk;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(n, rhs.get() + int64_t{j} * ldb, 1, X + j, nrhs);
  return st;
}

// ---- pseudo-inverse solves and pseudo-inverses ------------------------------------------

StatusCode LeastSquaresPinvReal(const double* A, int32_t m, int32_t n, const double* B,
                                int32_t nrhs, double* X, double rcond) {
  return PinvSolve<double>(A, m, n, B, nrhs, X, rcond);
}

StatusCode LeastSquaresComplex(const Complex* A, int32_t m, int32_t n, const Complex* B,
                               int32_t nrhs, Complex* X, double rcond) {
  return PinvSolve<Complex>(A, m, n, B, nrhs, X, rcond);
}

StatusCode LeastSquaresTruncatedReal(const double* A, int32_t m, int32_t n, const double* B,
                                     int32_t nrhs, double* X, int32_t keep) {
  return TruncatedSolve<double>(A, m, n, B, nrhs, X, keep);
}

StatusCode LeastSquaresTruncatedComplex(const Complex* A, int32_t m, int32_t n, const Complex* B,
                                        int32_t nrhs, Complex* X, int32_t keep) {
  return TruncatedSolve<Complex>(A, m, n, B, nrhs, X, keep);
}

double TruncationThreshold(const double* S, int32_t count, int32_t keep) {
  if (keep == count) return S[keep - 1] * 0.5;
  if (keep >= 1 && keep < count) return (S[keep - 1] + S[keep]) * 0.5;
  return 0.0;
}

StatusCode PseudoInverseReal(double* A, int32_t m, int32_t n, double tol, double* out) {
  return PseudoInverse<double>(A, m, n, tol, out);
}

StatusCode PseudoInverseComplex(Complex* A, int32_t m, int32_t n, double tol, Complex* out) {
  return PseudoInverse<Complex>(A, m, n, tol, out);
}
