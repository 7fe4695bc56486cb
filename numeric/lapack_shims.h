// Overloaded shims over the BLAS and LAPACK routines the numeric layer uses, so
// that one template body serves the real (d) and complex (z) twin. Integers are
// LAPACK's 32-bit lapack_int; every shim is a direct forward with no policy of
// its own (workspace sizing and INFO mapping stay with the callers).
#pragma once

#include <cstdint>

#include "numeric/lapack_api.h"
#include "core/types.h"

namespace lapack {

// ---- BLAS -------------------------------------------------------------------------
// y(0:n) with stride incy = x(0:n) with stride incx.
inline void Copy(int32_t n, const double* x, int32_t incx, double* y, int32_t incy) {
  cblas_dcopy(n, x, incx, y, incy);
}
inline void Copy(int32_t n, const Complex* x, int32_t incx, Complex* y, int32_t incy) {
  cblas_zcopy(n, x, incx, y, incy);
}

// Row-major C (m-by-n) = A (m-by-k) * B (k-by-n), no transposes, beta = 0.
inline void Gemm(int32_t m, int32_t n, int32_t k, const double* A, const double* B, double* C) {
  cblas_dgemm(CblasRowMajor, CblasNoTrans, CblasNoTrans, m, n, k, 1.0, A, k, B, n, 0.0, C, n);
}
inline void Gemm(int32_t m, int32_t n, int32_t k, const Complex* A, const Complex* B,
                 Complex* C) {
  const Complex one(1.0, 0.0);
  const Complex zero(0.0, 0.0);
  cblas_zgemm(CblasRowMajor, CblasNoTrans, CblasNoTrans, m, n, k, &one, A, k, B, n, &zero, C, n);
}

// ---- LAPACK -----------------------------------------------------------------------
// Divide-and-conquer SVD, column-major. rwork is ignored by the real form.
inline void Gesdd(char jobz, lapack_int m, lapack_int n, double* a, lapack_int lda, double* s,
                  double* u, lapack_int ldu, double* vt, lapack_int ldvt, double* work,
                  lapack_int lwork, double* /*rwork*/, lapack_int* iwork, lapack_int* info) {
  LAPACK_dgesdd(&jobz, &m, &n, a, &lda, s, u, &ldu, vt, &ldvt, work, &lwork, iwork, info);
}
inline void Gesdd(char jobz, lapack_int m, lapack_int n, Complex* a, lapack_int lda, double* s,
                  Complex* u, lapack_int ldu, Complex* vt, lapack_int ldvt, Complex* work,
                  lapack_int lwork, double* rwork, lapack_int* iwork, lapack_int* info) {
  LAPACK_zgesdd(&jobz, &m, &n, a, &lda, s, u, &ldu, vt, &ldvt, work, &lwork, rwork, iwork, info);
}

// Minimum-norm least squares by divide and conquer, column-major (real only).
inline void Gelsd(lapack_int m, lapack_int n, lapack_int nrhs, double* a, lapack_int lda,
                  double* b, lapack_int ldb, double* s, double rcond, lapack_int* rank,
                  double* work, lapack_int lwork, lapack_int* iwork, lapack_int* info) {
  LAPACK_dgelsd(&m, &n, &nrhs, a, &lda, b, &ldb, s, &rcond, rank, work, &lwork, iwork, info);
}

// The size a workspace query (LWORK = -1) left in WORK(1), truncated toward zero.
inline int64_t QueriedWorkSize(double w) { return static_cast<int64_t>(w); }
inline int64_t QueriedWorkSize(const Complex& w) { return static_cast<int64_t>(w.real()); }

}  // namespace lapack
