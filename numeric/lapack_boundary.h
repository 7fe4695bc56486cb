// The one boundary between the numeric layer and LAPACK/CBLAS. Every LAPACK
// driver the library calls is reached through a routine here that takes its
// workspace (a size query where the driver offers one, a fixed formula for the
// eigenvalue drivers), allocates it through NumAlloc, runs the driver and turns
// INFO into a StatusCode by the one mapping in lapack_boundary.cpp. One
// template serves the real (d) and complex (z) driver of a pair, instantiated
// for double and Complex; where their argument lists differ (geev) two
// overloads lead into it. Integers are
// LAPACK's 32-bit lapack_int.
//
// Every driver call is counted, and a test can make the k-th call from now
// report a chosen INFO instead of running (LapackFailAt), as NumAllocFailAt does
// for allocations.
#pragma once

#include <cstdint>

#include "core/types.h"
#include "numeric/lapack_api.h"

namespace lapack {

// ---- BLAS -------------------------------------------------------------------------
// y(0:n) with stride incy = x(0:n) with stride incx.
inline void Copy(int32_t n, const double* x, int32_t incx, double* y, int32_t incy) {
  cblas_dcopy(n, x, incx, y, incy);
}
inline void Copy(int32_t n, const Complex* x, int32_t incx, Complex* y, int32_t incy) {
  cblas_zcopy(n, x, incx, y, incy);
}

// Row-major C (m-by-n) = op(A) * B (k-by-n), beta = 0, where op(A) is A
// (m-by-k, lda = k) or, with adjointA, the adjoint of A (k-by-m, lda = m):
// the transpose for real data, the conjugate transpose for complex data.
inline void Gemm(int32_t m, int32_t n, int32_t k, const double* A, const double* B, double* C,
                 bool adjointA = false) {
  cblas_dgemm(CblasRowMajor, adjointA ? CblasTrans : CblasNoTrans, CblasNoTrans, m, n, k, 1.0, A,
              adjointA ? m : k, B, n, 0.0, C, n);
}
inline void Gemm(int32_t m, int32_t n, int32_t k, const Complex* A, const Complex* B, Complex* C,
                 bool adjointA = false) {
  const Complex one(1.0, 0.0);
  const Complex zero(0.0, 0.0);
  cblas_zgemm(CblasRowMajor, adjointA ? CblasConjTrans : CblasNoTrans, CblasNoTrans, m, n, k, &one,
              A, adjointA ? m : k, B, n, &zero, C, n);
}

// Row-major y (m) = A (m-by-k, lda = k) * x (k).
inline void Gemv(int32_t m, int32_t k, const double* A, const double* x, double* y) {
  cblas_dgemv(CblasRowMajor, CblasNoTrans, m, k, 1.0, A, k, x, 1, 0.0, y, 1);
}
inline void Gemv(int32_t m, int32_t k, const Complex* A, const Complex* x, Complex* y) {
  const Complex one(1.0, 0.0);
  const Complex zero(0.0, 0.0);
  cblas_zgemv(CblasRowMajor, CblasNoTrans, m, k, &one, A, k, x, 1, &zero, y, 1);
}

// Column-major y = alpha op(A) x + beta y for the m-by-n A (lda >= m): op(A) x
// has m values, op(A)^H x (adjointA) n. For a basis kept as contiguous columns.
inline void GemvCol(bool adjointA, int32_t m, int32_t n, double alpha, const double* A, int32_t lda,
                    const double* x, double beta, double* y) {
  cblas_dgemv(CblasColMajor, adjointA ? CblasTrans : CblasNoTrans, m, n, alpha, A, lda, x, 1, beta,
              y, 1);
}
inline void GemvCol(bool adjointA, int32_t m, int32_t n, Complex alpha, const Complex* A,
                    int32_t lda, const Complex* x, Complex beta, Complex* y) {
  cblas_zgemv(CblasColMajor, adjointA ? CblasConjTrans : CblasNoTrans, m, n, &alpha, A, lda, x, 1,
              &beta, y, 1);
}
// Column-major C (m-by-n, ldc) = A (m-by-k, lda) B (k-by-n, ldb).
inline void GemmCol(int32_t m, int32_t n, int32_t k, const double* A, int32_t lda, const double* B,
                    int32_t ldb, double* C, int32_t ldc) {
  cblas_dgemm(CblasColMajor, CblasNoTrans, CblasNoTrans, m, n, k, 1.0, A, lda, B, ldb, 0.0, C, ldc);
}
inline void GemmCol(int32_t m, int32_t n, int32_t k, const Complex* A, int32_t lda,
                    const Complex* B, int32_t ldb, Complex* C, int32_t ldc) {
  const Complex one(1.0, 0.0);
  const Complex zero(0.0, 0.0);
  cblas_zgemm(CblasColMajor, CblasNoTrans, CblasNoTrans, m, n, k, &one, A, lda, B, ldb, &zero, C,
              ldc);
}
// x (n) replaced by op(A)^-1 x for the upper triangular A (column-major, lda),
// op(A) = A, or its conjugate transpose with adjointA.
inline void TrsvUpper(bool adjointA, int32_t n, const Complex* A, int32_t lda, Complex* x) {
  cblas_ztrsv(CblasColMajor, CblasUpper, adjointA ? CblasConjTrans : CblasNoTrans, CblasNonUnit, n,
              A, lda, x, 1);
}
// Euclidean norm of x (n values), without overflow or underflow on the way.
inline double Nrm2(int32_t n, const double* x) { return cblas_dnrm2(n, x, 1); }
inline double Nrm2(int32_t n, const Complex* x) { return cblas_dznrm2(n, x, 1); }

// ---- LAPACK drivers, column-major ---------------------------------------------------
// Each returns 0, -20001 when its workspace cannot be had, or the status its
// INFO maps to (see lapack_boundary.cpp for the mapping of each driver).

// Divide-and-conquer SVD (jobz 'S' or 'A').
template <typename T>
[[nodiscard]] StatusCode Gesdd(char jobz, lapack_int m, lapack_int n, T* a, lapack_int lda,
                               double* s, T* u, lapack_int ldu, T* vt, lapack_int ldvt);

// The `count` largest singular values (decreasing) of the m-by-n a and their
// left singular vectors, u (m-by-count, ldu), as gesdd finds them; a is
// overwritten. One driver call, mapped as gesdd.
template <typename T>
[[nodiscard]] StatusCode LeadingLeftSvd(lapack_int m, lapack_int n, T* a, lapack_int lda,
                                        lapack_int count, double* s, T* u, lapack_int ldu);

// Minimum-norm least squares by divide and conquer (real only); *rank as
// LAPACK leaves it.
[[nodiscard]] StatusCode Gelsd(lapack_int m, lapack_int n, lapack_int nrhs, double* a,
                               lapack_int lda, double* b, lapack_int ldb, double* s, double rcond,
                               lapack_int* rank);

// Householder QR, A = Q R: R in the upper triangle of a, Q as reflectors below
// it and in tau (min(m, n) values).
template <typename T>
[[nodiscard]] StatusCode Geqrf(lapack_int m, lapack_int n, T* a, lapack_int lda, T* tau);

// Householder QR of the m-by-n a in compact-WY blocks (real only): R in the
// upper triangle of a, the reflectors below it.
[[nodiscard]] StatusCode Geqrt(lapack_int m, lapack_int n, double* a, lapack_int lda);

// QR of [a; b], a n-by-n upper triangular (its lower part never read) on top of
// the m-by-n b (real only): R replaces a's upper triangle, the reflectors
// replace b.
[[nodiscard]] StatusCode Tpqrt(lapack_int m, lapack_int n, double* a, lapack_int lda, double* b,
                               lapack_int ldb);

// General eigenproblem, left vectors only (jobvl 'V' or 'N'). The workspace is
// the caller's, of GeevWorkSize elements: it lives in the caller's own block.
int64_t GeevWorkSize(int32_t n, bool complex);
[[nodiscard]] StatusCode Geev(char jobvl, lapack_int n, double* a, double* wr, double* wi,
                              double* vl, double* work);
[[nodiscard]] StatusCode Geev(char jobvl, lapack_int n, Complex* a, Complex* w, Complex* vl,
                              Complex* work, double* rwork);

// Symmetric / Hermitian divide and conquer, UPLO 'U', eigenvalues ascending in w.
template <typename T>
[[nodiscard]] StatusCode Syevd(char jobz, lapack_int n, T* a, double* w);

// Cholesky factorization of the Hermitian a (UPLO 'U', complex only): a = R^H R
// with R in the upper triangle. A matrix that is not positive definite is an
// answer, not a failure: *notDefinite gets the order of the first leading minor
// that is not (LAPACK's INFO > 0), 0 when a is, and the status stays 0.
[[nodiscard]] StatusCode Potrf(lapack_int n, Complex* a, lapack_int lda, lapack_int* notDefinite);

// Reciprocal 1-norm condition estimate of a Hermitian positive definite matrix
// from its Cholesky factor (UPLO 'U', complex only); anorm is the matrix's own
// 1-norm.
[[nodiscard]] StatusCode Pocon(lapack_int n, const Complex* a, lapack_int lda, double anorm,
                               double* rcond);

}  // namespace lapack

// ---- driver failures injected by tests ------------------------------------------------
// Makes the k-th LAPACK driver call from now (k >= 1) report `info` without
// running; with `persistent` every call from the k-th on does. k = 0 switches
// injection off. A driver call is one routine above, its workspace query
// included.
void LapackFailAt(int64_t k, int32_t info, bool persistent);
// LAPACK driver calls made since the last LapackFailAt call.
int64_t LapackCalls();
