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
// The drivers, their workspaces and their INFO mapping are in lapack_boundary.cpp.

#include <cstdint>
#include <cstring>
#include <type_traits>

#include "numeric/lapack_boundary.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

// Flips the sign of the imaginary part of every element (conjugation by sign bit).
void ConjugateInPlace(Complex* x, size_t count) {
  for (size_t i = 0; i < count; ++i) x[i] = Complex(x[i].real(), -x[i].imag());
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

  WorkArray<T> a = AllocWorkUninit<T>(nn);
  if (!a) return status::kNoMemory;
  std::memcpy(static_cast<void*>(a.get()), A, nn * sizeof(T));
  const StatusCode st = lapack::Syevd(wantVectors == 1 ? 'V' : 'N', n, a.get(), eigenvalues);
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

  // One block: WORK, the copy of A (n*n), WR (n), WI (n); VL on its own.
  const size_t nz = static_cast<size_t>(n);
  const size_t lwork = static_cast<size_t>(lapack::GeevWorkSize(n, false));
  WorkArray<double> block = AllocWorkUninit<double>(nn + lwork + 2 * nz);
  if (!block) return status::kNoMemory;
  WorkArray<double> vl;
  if (wantVectors == 1) {
    vl = AllocWorkUninit<double>(nn);
    if (!vl) return status::kNoMemory;
  }
  double* work = block.get();
  double* a = work + lwork;
  double* wr = a + nn;
  double* wi = wr + nz;
  std::memcpy(a, A, nn * sizeof(double));

  const StatusCode st = lapack::Geev(wantVectors == 1 ? 'V' : 'N', n, a, wr, wi, vl.get(), work);
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

  // One complex block: the copy of A (n*n), then WORK; RWORK (2n); VL.
  const size_t nz = static_cast<size_t>(n);
  WorkArray<Complex> block =
      AllocWorkUninit<Complex>(nn + static_cast<size_t>(lapack::GeevWorkSize(n, true)));
  WorkArray<double> rwork = AllocWorkUninit<double>(2 * nz);
  if (!block || !rwork) return status::kNoMemory;
  WorkArray<Complex> vl;
  if (wantVectors == 1) {
    vl = AllocWorkUninit<Complex>(nn);
    if (!vl) return status::kNoMemory;
  }
  Complex* a = block.get();
  Complex* work = a + nn;
  std::memcpy(a, A, nn * sizeof(Complex));

  const StatusCode st =
      lapack::Geev(wantVectors == 1 ? 'V' : 'N', n, a, eigenvalues, vl.get(), work, rwork.get());
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
