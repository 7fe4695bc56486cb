// Least-squares solves and pseudo-inverses. The real solve runs DGELSD except for
// very wide systems, which go through the SVD pseudo-inverse; the pseudo-inverse
// solves and the pseudo-inverses are built on the economy SVD A = U diag(S) V^H
// as pinv(A) = V diag(1/S) U^H over the singular values above a threshold.

#include <algorithm>
#include <cmath>
#include <cstring>
#include <type_traits>

#include "core/call_record.h"
#include "numeric/lapack_shims.h"
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

// X = pinv(A) B, with singular values at or below max(m, n) S[0] e dropped,
// e = rcond when positive, machine epsilon otherwise.
template <typename T>
StatusCode PinvSolve(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs, T* X,
                     double rcond) {
  if constexpr (kIsComplex<T>) {
    // Deliberately narrower than the real twin: nrhs is not checked (a negative
    // count surfaces as the product's -20004), and only B is screened here;
    // the SVD screens A.
    if (m < 1 || n < 1) return status::kBadSize;
    if (HasNonFiniteComplex(B, int64_t{m} * nrhs) != 0) return status::kNonFinite;
  } else {
    if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
    if (HasNonFiniteReal(A, int64_t{m} * n) != 0 || HasNonFiniteReal(B, int64_t{m} * nrhs) != 0) {
      return status::kNonFinite;
    }
  }
  const int32_t k = std::min(m, n);
  const int64_t mn = int64_t{m} * n;

  Factors<T> f;
  if (!f.Allocate(m, n, k)) return status::kNoMemory;
  StatusCode st = SvdOf(A, m, n, f.U, f.S, f.V);
  if (st != status::kOk) return st;

  const double e = rcond > 0.0 ? rcond : kEpsilon;
  const double threshold = std::max(m, n) * f.S[0] * e;
  const int32_t kept = InvertKeptColumns(f.V, n, k, f.S, threshold);

  WorkArray<T> pinv = AllocWork<T>(static_cast<size_t>(mn));
  if (!pinv) return status::kNoMemory;
  st = FormPinv(f, m, n, k, pinv.get());
  if (st != status::kOk) return st;

  // B followed by X' = P B, m*nrhs + n*nrhs elements.
  const int64_t b_count = std::max<int64_t>(int64_t{m} * nrhs, 0);
  const int64_t x_count = std::max<int64_t>(int64_t{n} * nrhs, 0);
  WorkArray<T> rhs_block;
  T* rhs = nullptr;
  if constexpr (kIsComplex<T>) {
    // The factor block is free again; it is reused, grown when nrhs > k.
    if (nrhs > k) {
      void* raw = f.uv.release();
      st = NumRealloc(&raw, static_cast<size_t>(b_count + x_count) * sizeof(T));
      f.uv.reset(static_cast<T*>(raw));
      if (st != status::kOk) return st;
    }
    rhs = f.uv.get();
  } else {
    rhs_block = AllocWork<T>(static_cast<size_t>(b_count + x_count));
    if (!rhs_block) return status::kNoMemory;
    rhs = rhs_block.get();
  }
  if (b_count > 0) std::memcpy(static_cast<void*>(rhs), B, static_cast<size_t>(b_count) * sizeof(T));
  st = MatMul<T>(pinv.get(), rhs, n, m, nrhs, rhs + b_count, false);
  if (st != status::kOk) return st;
  if (x_count > 0) {
    std::memcpy(static_cast<void*>(X), rhs + b_count, static_cast<size_t>(x_count) * sizeof(T));
  }
  return kept == k ? status::kOk : status::kRankDeficient;
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

namespace {

StatusCode GelsdSolve(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs,
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
  WorkArray<double> rhs = AllocWork<double>(static_cast<size_t>(int64_t{ldb} * nrhs));
  if (!rhs) return status::kNoMemory;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(m, B + j, nrhs, rhs.get() + int64_t{j} * ldb, 1);

  // A negative or NaN rcond selects machine epsilon; zero stays zero.
  const double r = rcond >= 0.0 ? rcond : kEpsilon;
  const double lapack_rcond = std::max(m, n) * r;

  // A^T row-major is A column-major with lda = m.
  WorkArray<double> a_col = AllocWork<double>(static_cast<size_t>(int64_t{m} * n));
  if (!a_col) return status::kNoMemory;
  StatusCode st = TransposeReal(const_cast<double*>(A), m, n, a_col.get());
  if (st != status::kOk) return st;
  WorkArray<double> sv = AllocWork<double>(static_cast<size_t>(k));
  if (!sv) return status::kNoMemory;

  // Integer workspace (3 depth + 14) k, depth = floor(log2 k): enough for the
  // divide-and-conquer tree of any block size.
  const int64_t depth = static_cast<int64_t>(std::log(static_cast<double>(k)) / std::log(2.0));
  WorkArray<lapack_int> iwork = AllocWork<lapack_int>(static_cast<size_t>((3 * depth + 14) * k));
  if (!iwork) return status::kNoMemory;

  double query = 0.0;
  lapack_int rank = 0;
  lapack_int info = 0;
  lapack::Gelsd(m, n, nrhs, a_col.get(), m, rhs.get(), ldb, sv.get(), lapack_rcond, &rank, &query,
                -1, iwork.get(), &info);
  const int64_t lwork = lapack::QueriedWorkSize(query);
  WorkArray<double> work = AllocWork<double>(static_cast<size_t>(std::max<int64_t>(lwork, 0)));
  if (!work) return status::kNoMemory;
  lapack::Gelsd(m, n, nrhs, a_col.get(), m, rhs.get(), ldb, sv.get(), lapack_rcond, &rank,
                work.get(), static_cast<lapack_int>(lwork), iwork.get(), &info);
  if (info > 0) return status::kNoConvergence;

  st = rank < k ? status::kRankDeficient : status::kOk;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(n, rhs.get() + int64_t{j} * ldb, 1, X + j, nrhs);
  return st;
}

}  // namespace

StatusCode LeastSquaresReal(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs,
                            double* X, double rcond) {
  const StatusCode st = GelsdSolve(A, m, n, B, nrhs, X, rcond);
  call_record::Note(st);
  return st;
}

// ---- pseudo-inverse solves and pseudo-inverses ------------------------------------------

StatusCode LeastSquaresPinvReal(const double* A, int32_t m, int32_t n, const double* B,
                                int32_t nrhs, double* X, double rcond) {
  const StatusCode st = PinvSolve<double>(A, m, n, B, nrhs, X, rcond);
  call_record::Note(st);
  return st;
}

StatusCode LeastSquaresComplex(const Complex* A, int32_t m, int32_t n, const Complex* B,
                               int32_t nrhs, Complex* X, double rcond) {
  const StatusCode st = PinvSolve<Complex>(A, m, n, B, nrhs, X, rcond);
  call_record::Note(st);
  return st;
}

StatusCode PseudoInverseReal(double* A, int32_t m, int32_t n, double tol, double* out) {
  return PseudoInverse<double>(A, m, n, tol, out);
}

StatusCode PseudoInverseComplex(Complex* A, int32_t m, int32_t n, double tol, Complex* out) {
  return PseudoInverse<Complex>(A, m, n, tol, out);
}
