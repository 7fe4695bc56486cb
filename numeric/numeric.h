// Numeric support: dense linear algebra over LAPACK/CBLAS, the polynomial root
// finder, sorting and scalar helpers. Matrices are dense and row-major (element
// (i, j) of an m-by-n matrix at i*n + j); complex values are Complex (two
// doubles, real part first). Every routine returns a StatusCode (core/types.h).
// Pointers are assumed aligned for their element type: host memory never
// reaches this layer directly.
#pragma once

#include <cstdint>

#include "core/scalar.h"
#include "core/types.h"

// ---- products and vector helpers ---------------------------------------------
// C (m-by-n) = A (m-by-k) * B (k-by-n). C must not overlap A or B.
[[nodiscard]] StatusCode MatMulReal(const double* A, const double* B, int32_t m, int32_t k,
                                    int32_t n, double* C);
[[nodiscard]] StatusCode MatMulComplex(const Complex* A, const Complex* B, int32_t m, int32_t k,
                                       int32_t n, Complex* C);
[[nodiscard]] StatusCode DotReal(const double* x, const double* y, int32_t n, double* result);
[[nodiscard]] StatusCode VecSubReal(const double* a, const double* b, int32_t n, double* out);
// 1 if some value is NaN, infinite, == DBL_MAX or <= -1.7976931348623e308; else 0.
int32_t HasNonFiniteReal(const double* x, int64_t n);
int32_t HasNonFiniteComplex(const Complex* x, int64_t n);
// n-by-m transpose of the m-by-n A into out, or over A when out is null.
[[nodiscard]] StatusCode TransposeReal(double* A, int32_t m, int32_t n, double* out);
[[nodiscard]] StatusCode ConjTransposeComplex(Complex* A, int32_t m, int32_t n, Complex* out);

// ---- singular value decomposition ----------------------------------------------
// A = U diag(S) V^H; economy (full = 0): U m-by-k, V n-by-k; full: U m-by-m,
// V n-by-n; k = min(m, n); S non-increasing. V itself, not V^H. A untouched.
[[nodiscard]] StatusCode SvdReal(const double* A, int32_t m, int32_t n, double* U, double* S,
                                 double* V, int32_t full);
[[nodiscard]] StatusCode SvdComplex(const Complex* A, int32_t m, int32_t n, Complex* U, double* S,
                                    Complex* V, int32_t full);

// ---- least squares and pseudo-inverse ------------------------------------------
// X (n-by-nrhs) minimising ||A X - B||, minimum norm; 20001 when rank deficient.
[[nodiscard]] StatusCode LeastSquaresReal(const double* A, int32_t m, int32_t n, const double* B,
                                          int32_t nrhs, double* X, double rcond);
[[nodiscard]] StatusCode LeastSquaresPinvReal(const double* A, int32_t m, int32_t n,
                                              const double* B, int32_t nrhs, double* X,
                                              double rcond);
[[nodiscard]] StatusCode LeastSquaresComplex(const Complex* A, int32_t m, int32_t n,
                                             const Complex* B, int32_t nrhs, Complex* X,
                                             double rcond);
// Halfway between the keep-th and (keep+1)-th of the `count` non-increasing
// singular values S (half the keep-th when keep == count; 0 when keep is out
// of range), so that exactly the keep strongest pass a strict "S > tau" test
// unless values tie at the boundary.
double TruncationThreshold(const double* S, int32_t count, int32_t keep);
// pinv(A), n-by-m, into out or over A when out is null.
[[nodiscard]] StatusCode PseudoInverseReal(double* A, int32_t m, int32_t n, double tol,
                                           double* out);
[[nodiscard]] StatusCode PseudoInverseComplex(Complex* A, int32_t m, int32_t n, double tol,
                                              Complex* out);

// ---- eigenproblems ---------------------------------------------------------------
// General: n complex eigenvalues in LAPACK's order; vectors (n-by-n, column j
// the right eigenvector of eigenvalue j) when wantVectors = 1.
[[nodiscard]] StatusCode EigGeneralReal(const double* A, int32_t n, int32_t wantVectors,
                                        Complex* eigenvalues, Complex* vectors);
// vectors may be null: then written over A.
[[nodiscard]] StatusCode EigGeneralComplex(Complex* A, int32_t n, int32_t wantVectors,
                                           Complex* eigenvalues, Complex* vectors);
// Symmetric / Hermitian: n real eigenvalues ascending. EigSymReal writes the
// vectors over A when vectors is null.
[[nodiscard]] StatusCode EigSymReal(double* A, int32_t n, int32_t wantVectors, double* eigenvalues,
                                    double* vectors);
[[nodiscard]] StatusCode EigHermitianComplex(const Complex* A, int32_t n, int32_t wantVectors,
                                             double* eigenvalues, Complex* vectors);
// hermitian = 0: EigGeneralComplex; 1: EigHermitianComplex with (w, 0) values.
[[nodiscard]] StatusCode EigComplex(Complex* A, int32_t n, int32_t hermitian, int32_t wantVectors,
                                    Complex* eigenvalues, Complex* vectors);

// ---- sorting and scalar helpers --------------------------------------------------
// NaN values first, then the rest ascending (descending = 0) or descending.
// Into out when given (x copied there first unless out == x), else in x.
[[nodiscard]] StatusCode SortReal(double* x, int32_t n, int32_t descending, double* out);
// Largest and smallest non-NaN values with their first indices; all NaN:
// NaN values and indices -1.
[[nodiscard]] StatusCode MinMaxReal(const double* x, int32_t n, double* maxValue, int32_t* maxIndex,
                                    double* minValue, int32_t* minIndex);
StatusCode ComplexToPolar(double re, double im, double* magnitude, double* angle);
StatusCode ComplexDivide(double a, double b, double c, double d, double* re, double* im);
StatusCode ComplexSqrt(double re, double im, double* outRe, double* outIm);

// ---- polynomial roots --------------------------------------------------------------
// Roots of c[0] + c[1] z + ... + c[n-1] z^(n-1); roots may be the same array as c.
[[nodiscard]] StatusCode PolyRootsComplex(const Complex* c, int32_t n, int32_t maxIterations,
                                          Complex* roots);

// ---- the same routines over the element type ------------------------------------------
// One template per routine, T double or Complex, instantiated for both in the
// routine's own .cpp; the named ...Real / ...Complex forms above are one-line
// wrappers over these, and the templates of the layers above call these.

// C (m-by-n) = A (m-by-k) * B (k-by-n), as MatMulReal / MatMulComplex.
template <typename T>
[[nodiscard]] StatusCode MatMul(const T* A, const T* B, int32_t m, int32_t k, int32_t n, T* C);
// C (m-by-n) = A^H B for A k-by-m and B k-by-n (the transpose for real data):
// the Gram-type product of two tall blocks, with no transposed copy. k >= 0
// (k = 0 gives zeros). C must not overlap A or B.
template <typename T>
[[nodiscard]] StatusCode AdjointMatMul(const T* A, const T* B, int32_t k, int32_t m, int32_t n,
                                       T* C);
// Z (rows-by-k, row-major) = H V for the Hankel H[i][j] = x[i + cols - 1 - j]
// (rows-by-cols, reading x[0 .. rows+cols-2]; the forward prediction block of
// x, with rows past its last), V cols-by-k row-major. H is never formed whole.
template <typename T>
[[nodiscard]] StatusCode HankelProduct(const T* x, int32_t rows, int32_t cols, const T* V,
                                       int32_t k, T* Z);
// out[i] = a[i] - b[i]; n < 1 is refused.
template <typename T>
[[nodiscard]] StatusCode VecSub(const T* a, const T* b, int32_t n, T* out);
// 1 when some part is rejected by the finiteness screen, as HasNonFiniteReal.
template <typename T>
int32_t HasNonFinite(const T* x, int64_t n);
// n-by-m adjoint (transpose for real data, conjugate transpose for complex
// data) of the m-by-n A into out, or over A when out is null.
template <typename T>
[[nodiscard]] StatusCode Adjoint(T* A, int32_t m, int32_t n, T* out);
// out (n-by-m) = the transpose of the m-by-n A, conjugated when `conjugate` is
// set (complex only), in cache-sized tiles; out does not overlap A. This is also
// the column-major copy of a row-major A (lda = m).
template <typename T>
void TransposeTo(const T* A, int32_t m, int32_t n, T* out, bool conjugate);

// A = U diag(S) V^H, as SvdReal / SvdComplex.
template <typename T>
[[nodiscard]] StatusCode Svd(const T* A, int32_t m, int32_t n, T* U, double* S, T* V, int32_t full);
// The `count` largest singular values (non-increasing) with their vectors only:
// U m-by-count, V n-by-count, A = U diag(S) V^H + the rest. A untouched.
template <typename T>
[[nodiscard]] StatusCode SvdLeading(const T* A, int32_t m, int32_t n, int32_t count, T* U,
                                    double* S, T* V);
// The same S and V without U, at a fraction of the cost for a square A.
template <typename T>
[[nodiscard]] StatusCode SvdLeadingRight(const T* A, int32_t m, int32_t n, int32_t count, double* S,
                                         T* V);

// X minimising ||A X - B||: LeastSquaresReal for real data (the minimum-norm
// driver), LeastSquaresComplex for complex data (the pseudo-inverse solve).
template <typename T>
[[nodiscard]] StatusCode LeastSquares(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs,
                                      T* X, double rcond);
// X = pinv_tau(A) B, pinv_tau over the singular values of A above the absolute
// threshold TruncationThreshold(S, min(m, n), keep); 0 whatever the rank.
template <typename T>
[[nodiscard]] StatusCode LeastSquaresTruncated(const T* A, int32_t m, int32_t n, const T* B,
                                               int32_t nrhs, T* X, int32_t keep);
// The forward prediction problem of the n samples x for order p: w (p values)
// minimising ||A w - b|| with A[i][j] = x[i + p - 1 - j] and b[i] = x[i + p],
// i < n - p. The answer, statuses and call-record notes are those of
// LeastSquares on the formed A and b with nrhs = 1; a tall system
// (n - p >= 2p) is never formed.
template <typename T>
[[nodiscard]] StatusCode ForwardLeastSquares(const T* x, int32_t n, int32_t p, T* w, double rcond);
// R (n-by-n, row-major, upper triangular, zeros below) of A = QR for the
// m-by-n Hankel matrix A[i][j] = x[i + n - 1 - j] (m >= n; reads x[0 .. m+n-2]),
// the forward prediction block of x, which is never formed. Q is not kept and
// x is not screened; a non-finite R is refused with -20068.
template <typename T>
[[nodiscard]] StatusCode QrReduceHankel(const T* x, int32_t m, int32_t n, T* R);
// pinv(A), n-by-m, into out or over A when out is null.
template <typename T>
[[nodiscard]] StatusCode PseudoInverse(T* A, int32_t m, int32_t n, double tol, T* out);

// n complex eigenvalues of the general A in LAPACK's order, A left as it is;
// with wantVectors = 1 the right eigenvectors into `vectors` (n-by-n, column j
// for eigenvalue j), which may be A itself.
template <typename T>
[[nodiscard]] StatusCode EigGeneral(const T* A, int32_t n, int32_t wantVectors,
                                    Complex* eigenvalues, Complex* vectors);
