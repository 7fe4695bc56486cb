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
  if (n <= 0) return status::kBadSize;
  if (wantVectors > 1) return status::kBadOption;
  const size_t nn = static_cast<size_t>(n) * static_cast<size_t>(n);
  if (HasNonFinite(A, static_cast<int64_t>(nn)) != 0) return status::kNonFinite;

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
    if constexpr (kIsComplex<T>) ConjugateInPlace(dest, nn);
  }
  return status::kOk;
}

}  // namespace

// ---- general matrices -------------------------------------------------------------

// The real driver returns WR and WI and packs a complex pair's left vectors
// into two real columns; the complex driver returns both whole. Each twin
// keeps its own work block (the real one leads with WORK, the complex one with
// the copy of A), so the drivers see the same addresses as they always have.
template <typename T>
StatusCode EigGeneral(const T* A, int32_t n, int32_t wantVectors, Complex* eigenvalues,
                      Complex* vectors) {
  if (n < 1) return status::kBadSize;
  if (wantVectors > 1) return status::kBadOption;
  const size_t nn = static_cast<size_t>(n) * static_cast<size_t>(n);
  if (HasNonFinite(A, static_cast<int64_t>(nn)) != 0) return status::kNonFinite;

  const size_t nz = static_cast<size_t>(n);
  const size_t lwork = static_cast<size_t>(lapack::GeevWorkSize(n, kIsComplex<T>));
  const char jobvl = wantVectors == 1 ? 'V' : 'N';
  StatusCode st = status::kOk;
  if constexpr (kIsComplex<T>) {
    // One complex block: the copy of A (n*n), then WORK; RWORK (2n); VL.
    WorkArray<Complex> block = AllocWorkUninit<Complex>(nn + lwork);
    WorkArray<double> rwork = AllocWorkUninit<double>(2 * nz);
    if (!block || !rwork) return status::kNoMemory;
    WorkArray<Complex> vl;
    if (wantVectors == 1) {
      vl = AllocWorkUninit<Complex>(nn);
      if (!vl) return status::kNoMemory;
    }
    Complex* a = block.get();
    std::memcpy(a, A, nn * sizeof(Complex));
    st = lapack::Geev(jobvl, n, a, eigenvalues, vl.get(), a + nn, rwork.get());
    if (st != status::kOk || wantVectors != 1) return st;
    for (int32_t j = 0; j < n; ++j) {
      lapack::Copy(n, vl.get() + static_cast<size_t>(j) * nz, 1, vectors + j, n);
    }
    ConjugateInPlace(vectors, nn);  // left vectors of A^T -> right vectors of A
  } else {
    // One block: WORK, the copy of A (n*n), WR (n), WI (n); VL on its own.
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
    st = lapack::Geev(jobvl, n, a, wr, wi, vl.get(), work);
    if (st != status::kOk) return st;

    double* values = reinterpret_cast<double*>(eigenvalues);
    lapack::Copy(n, wr, 1, values, 2);
    lapack::Copy(n, wi, 1, values + 1, 2);
    if (wantVectors != 1) return status::kOk;
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
template StatusCode EigGeneral(const double*, int32_t, int32_t, Complex*, Complex*);
template StatusCode EigGeneral(const Complex*, int32_t, int32_t, Complex*, Complex*);

StatusCode EigGeneralReal(const double* A, int32_t n, int32_t wantVectors, Complex* eigenvalues,
                          Complex* vectors) {
  return EigGeneral(A, n, wantVectors, eigenvalues, vectors);
}

StatusCode EigGeneralComplex(Complex* A, int32_t n, int32_t wantVectors, Complex* eigenvalues,
                             Complex* vectors) {
  return EigGeneral<Complex>(A, n, wantVectors, eigenvalues, vectors != nullptr ? vectors : A);
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
