// Eigenvalue problems over LAPACK: general real and complex matrices (DGEEV,
// ZGEEV), real symmetric and complex Hermitian ones (DSYEVD, ZHEEVD), and the
// complex front end that picks one of the two.
//
// Row-major storage meets column-major LAPACK without any transposition: LAPACK
// reads the row-major n-by-n array as A^T. The general solvers therefore ask
// for *left* eigenvectors of A^T: u^H A^T = lambda u^H gives A conj(u) = lambda
// conj(u), so the conjugated left vectors are the right eigenvectors of A. The
// symmetric solver sees A^T = A itself; the Hermitian one sees A^T = conj(A),
// whose eigenvectors are the conjugates of A's.
//
// Workspaces are sized by formula, never by a query.

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <type_traits>

#include "numeric/lapack_shims.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

// Flips the sign of the imaginary part of every element (conjugation by sign bit).
void ConjugateInPlace(Complex* x, size_t count) {
  for (size_t i = 0; i < count; ++i) x[i] = Complex(x[i].real(), -x[i].imag());
}

StatusCode MapInfo(lapack_int info) {
  if (info < 0) return status::kIllegalArgument;
  if (info > 0) return status::kNoConvergence;
  return status::kOk;
}

// Divide-and-conquer symmetric / Hermitian drivers. rwork is unused by the real one.
void SymmetricEig(char jobz, lapack_int n, double* a, double* w, double* work, lapack_int lwork,
                  double* /*rwork*/, lapack_int /*lrwork*/, lapack_int* iwork, lapack_int liwork,
                  lapack_int* info) {
  const char uplo = 'U';
  LAPACK_dsyevd(&jobz, &uplo, &n, a, &n, w, work, &lwork, iwork, &liwork, info);
}
void SymmetricEig(char jobz, lapack_int n, Complex* a, double* w, Complex* work, lapack_int lwork,
                  double* rwork, lapack_int lrwork, lapack_int* iwork, lapack_int liwork,
                  lapack_int* info) {
  const char uplo = 'U';
  LAPACK_zheevd(&jobz, &uplo, &n, a, &n, w, work, &lwork, rwork, &lrwork, iwork, &liwork, info);
}

// n * trunc(2 (log2 n + 1) + c1 n + c0) + 1, with log2 n = ln n / ln 2; -1 when
// the size does not fit LAPACK's 32-bit integer.
int64_t LogWorkSize(int32_t n, double c1, double c0) {
  const double log2n = std::log(static_cast<double>(n)) / std::log(2.0);
  const double per_column = std::trunc(2.0 * (log2n + 1.0) + c1 * n + c0);
  const double size = static_cast<double>(n) * per_column + 1.0;
  if (size > static_cast<double>(std::numeric_limits<lapack_int>::max())) return -1;
  return static_cast<int64_t>(size);
}

// Shared body of EigSymReal and EigHermitianComplex. `dest` receives the
// vectors (null: not stored).
template <typename T>
StatusCode EigSymmetric(const T* A, int32_t n, int32_t wantVectors, double* eigenvalues, T* dest) {
  constexpr bool kComplex = std::is_same_v<T, Complex>;
  if (n <= 0) return status::kBadSize;
  if (wantVectors > 1) return status::kBadOption;
  const size_t nn = static_cast<size_t>(n) * static_cast<size_t>(n);
  if constexpr (kComplex) {
    if (HasNonFiniteComplex(A, static_cast<int64_t>(nn)) != 0) return status::kNonFinite;
  } else {
    if (HasNonFiniteReal(A, static_cast<int64_t>(nn)) != 0) return status::kNonFinite;
  }

  // Sized for JOBZ = 'V' whatever is asked. DSYEVD needs WORK >= 1 + 6n + 2n^2;
  // ZHEEVD needs WORK >= 2n + n^2 and RWORK >= 1 + 5n + 2n^2. Both need
  // IWORK >= 3 + 5n.
  const int64_t lwork = kComplex ? LogWorkSize(n, 1.0, 0.0) : LogWorkSize(n, 3.0, 5.0);
  const int64_t lrwork = kComplex ? LogWorkSize(n, 3.0, 5.0) : 0;
  const int64_t liwork = 5 * static_cast<int64_t>(n) + 3;
  if (lwork < 0 || lrwork < 0 || liwork > std::numeric_limits<lapack_int>::max()) {
    return status::kNoMemory;
  }
  WorkArray<T> a = AllocWork<T>(nn);
  WorkArray<T> work = AllocWork<T>(static_cast<size_t>(lwork));
  WorkArray<double> rwork;
  if constexpr (kComplex) rwork = AllocWork<double>(static_cast<size_t>(lrwork));
  WorkArray<lapack_int> iwork = AllocWork<lapack_int>(static_cast<size_t>(liwork));
  if (!a || !work || (kComplex && !rwork) || !iwork) return status::kNoMemory;

  std::memcpy(a.get(), A, nn * sizeof(T));
  lapack_int info = 0;
  SymmetricEig(wantVectors == 1 ? 'V' : 'N', n, a.get(), eigenvalues, work.get(),
               static_cast<lapack_int>(lwork), rwork.get(), static_cast<lapack_int>(lrwork),
               iwork.get(), static_cast<lapack_int>(liwork), &info);
  const StatusCode st = MapInfo(info);
  if (st != status::kOk) return st;

  if (wantVectors == 1 && dest != nullptr) {
    // Column j of LAPACK's column-major result is contiguous; it becomes
    // column j (stride n) of the row-major destination.
    for (int32_t j = 0; j < n; ++j) {
      lapack::Copy(n, a.get() + static_cast<size_t>(j) * n, 1, dest + j, n);
    }
    // The Hermitian driver saw conj(A): its vectors are the conjugates of A's.
    if constexpr (kComplex) ConjugateInPlace(dest, nn);
  }
  return status::kOk;
}

}  // namespace

// ---- general matrices -------------------------------------------------------------

StatusCode EigGeneralReal(const double* A, int32_t n, int32_t wantVectors, Complex* eigenvalues,
                          Complex* vectors) {
  if (n < 1) return status::kBadSize;
  if (wantVectors > 1) return status::kBadOption;
  const size_t nn = static_cast<size_t>(n) * static_cast<size_t>(n);
  if (HasNonFiniteReal(A, static_cast<int64_t>(nn)) != 0) return status::kNonFinite;

  // One block: WORK (4n), the copy of A (n*n), WR (n), WI (n); VL on its own.
  const size_t nz = static_cast<size_t>(n);
  WorkArray<double> block = AllocWork<double>(nn + 6 * nz);
  if (!block) return status::kNoMemory;
  WorkArray<double> vl;
  if (wantVectors == 1) {
    vl = AllocWork<double>(nn);
    if (!vl) return status::kNoMemory;
  }
  double* work = block.get();
  double* a = work + 4 * nz;
  double* wr = a + nn;
  double* wi = wr + nz;
  std::memcpy(a, A, nn * sizeof(double));

  // LWORK = 4n is DGEEV's documented minimum when vectors are computed.
  const char jobvl = wantVectors == 1 ? 'V' : 'N';
  const char jobvr = 'N';
  const lapack_int lwork = 4 * n;
  double unused = 0.0;
  lapack_int info = 0;
  LAPACK_dgeev(&jobvl, &jobvr, &n, a, &n, wr, wi, vl ? vl.get() : &unused, &n, &unused, &n, work,
               &lwork, &info);
  const StatusCode st = MapInfo(info);
  if (st != status::kOk) return st;

  double* values = reinterpret_cast<double*>(eigenvalues);
  lapack::Copy(n, wr, 1, values, 2);
  lapack::Copy(n, wi, 1, values + 1, 2);

  if (wantVectors == 1) {
    // A real eigenvalue has the real column VL(:, j). A complex pair stores its
    // left vectors as u = VL(:, j) +- i VL(:, j+1); the right vectors of A are
    // their conjugates.
    const double* v = vl.get();
    for (int32_t j = 0; j < n; ++j) {
      const double* re = v + static_cast<size_t>(j) * nz;
      if (wi[j] == 0.0 || j + 1 == n) {
        for (size_t i = 0; i < nz; ++i) vectors[i * nz + j] = Complex(re[i], 0.0);
        continue;
      }
      const double* im = re + nz;
      for (size_t i = 0; i < nz; ++i) {
        vectors[i * nz + j] = Complex(re[i], -im[i]);
        vectors[i * nz + j + 1] = Complex(re[i], im[i]);
      }
      ++j;
    }
  }
  return status::kOk;
}

StatusCode EigGeneralComplex(Complex* A, int32_t n, int32_t wantVectors, Complex* eigenvalues,
                             Complex* vectors) {
  if (n < 1) return status::kBadSize;
  if (wantVectors > 1) return status::kBadOption;
  const size_t nn = static_cast<size_t>(n) * static_cast<size_t>(n);
  if (HasNonFiniteComplex(A, static_cast<int64_t>(nn)) != 0) return status::kNonFinite;

  // One complex block: the copy of A (n*n), then WORK (2n); RWORK (2n); VL.
  const size_t nz = static_cast<size_t>(n);
  WorkArray<Complex> block = AllocWork<Complex>(nn + 2 * nz);
  WorkArray<double> rwork = AllocWork<double>(2 * nz);
  if (!block || !rwork) return status::kNoMemory;
  WorkArray<Complex> vl;
  if (wantVectors == 1) {
    vl = AllocWork<Complex>(nn);
    if (!vl) return status::kNoMemory;
  }
  Complex* a = block.get();
  Complex* work = a + nn;
  std::memcpy(a, A, nn * sizeof(Complex));

  // LWORK = 2n is ZGEEV's documented minimum.
  const char jobvl = wantVectors == 1 ? 'V' : 'N';
  const char jobvr = 'N';
  const lapack_int lwork = 2 * n;
  Complex unused;
  lapack_int info = 0;
  LAPACK_zgeev(&jobvl, &jobvr, &n, a, &n, eigenvalues, vl ? vl.get() : &unused, &n, &unused, &n,
               work, &lwork, rwork.get(), &info);
  const StatusCode st = MapInfo(info);
  if (st != status::kOk) return st;

  if (wantVectors == 1) {
    Complex* dest = vectors != nullptr ? vectors : A;
    for (int32_t j = 0; j < n; ++j)
      lapack::Copy(n, vl.get() + static_cast<size_t>(j) * nz, 1, dest + j, n);
    ConjugateInPlace(dest, nn);  // left vectors of A^T -> right vectors of A
  }
  return status::kOk;
}

// ---- symmetric and Hermitian matrices -------------------------------------------------

StatusCode EigSymReal(double* A, int32_t n, int32_t wantVectors, double* eigenvalues,
                      double* vectors) {
  return EigSymmetric<double>(A, n, wantVectors, eigenvalues, vectors != nullptr ? vectors : A);
}

// A is read only: with a null vectors argument the vectors are not stored.
StatusCode EigHermitianComplex(const Complex* A, int32_t n, int32_t wantVectors,
                               double* eigenvalues, Complex* vectors) {
  return EigSymmetric<Complex>(A, n, wantVectors, eigenvalues, vectors);
}

// ---- complex front end --------------------------------------------------------------

// hermitian: 0 general, 1 Hermitian; anything else is refused as an option out
// of range. A null vectors argument means A's own storage on both branches.
StatusCode EigComplex(Complex* A, int32_t n, int32_t hermitian, int32_t wantVectors,
                      Complex* eigenvalues, Complex* vectors) {
  if (n < 1) return status::kBadSize;
  if (hermitian != 0 && hermitian != 1) return status::kBadOption;
  if (hermitian == 0) return EigGeneralComplex(A, n, wantVectors, eigenvalues, vectors);

  if (wantVectors > 1) return status::kBadOption;  // before the scratch below
  WorkArray<double> w = AllocWork<double>(static_cast<size_t>(n));
  if (!w) return status::kNoMemory;
  const StatusCode st =
      EigHermitianComplex(A, n, wantVectors, w.get(), vectors != nullptr ? vectors : A);
  if (st != status::kOk) return st;
  for (int32_t j = 0; j < n; ++j) eigenvalues[j] = Complex(w[j], 0.0);
  return status::kOk;
}
