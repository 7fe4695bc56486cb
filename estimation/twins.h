// Real/complex dispatch for the estimator templates. Each estimator is written
// once as a template over its element type T (double or Complex); the calls it
// makes into numeric support and into the other estimators go through these
// overloads, so a template body never names a ...Real or ...Complex routine.
// Where the twins deliberately differ, the template says so itself with
// `if constexpr (kIsComplex<T>)`.
#pragma once

#include <complex>
#include <type_traits>

#include "estimation/estimation.h"
#include "numeric/krylov.h"
#include "numeric/numeric.h"

namespace twin {

template <typename T>
inline constexpr bool kIsComplex = std::is_same_v<T, Complex>;

// ---- numeric support ----------------------------------------------------------------
inline StatusCode MatMul(const double* A, const double* B, int32_t m, int32_t k, int32_t n,
                         double* C) {
  return MatMulReal(A, B, m, k, n, C);
}
inline StatusCode MatMul(const Complex* A, const Complex* B, int32_t m, int32_t k, int32_t n,
                         Complex* C) {
  return MatMulComplex(A, B, m, k, n, C);
}
// The conjugate of a value (itself for real data).
inline double Conjugate(double v) { return v; }
inline Complex Conjugate(const Complex& v) { return std::conj(v); }
// C = A^H B (A k-by-m, B k-by-n).
inline StatusCode AdjointMatMul(const double* A, const double* B, int32_t k, int32_t m, int32_t n,
                                double* C) {
  return AdjointMatMulReal(A, B, k, m, n, C);
}
inline StatusCode AdjointMatMul(const Complex* A, const Complex* B, int32_t k, int32_t m, int32_t n,
                                Complex* C) {
  return AdjointMatMulComplex(A, B, k, m, n, C);
}
// Transpose for real data, conjugate transpose for complex data.
inline StatusCode AdjointInto(double* A, int32_t m, int32_t n, double* out) {
  return TransposeReal(A, m, n, out);
}
inline StatusCode AdjointInto(Complex* A, int32_t m, int32_t n, Complex* out) {
  return ConjTransposeComplex(A, m, n, out);
}
// Economy SVD.
inline StatusCode Svd(const double* A, int32_t m, int32_t n, double* U, double* S, double* V) {
  return SvdReal(A, m, n, U, S, V, 0);
}
inline StatusCode Svd(const Complex* A, int32_t m, int32_t n, Complex* U, double* S, Complex* V) {
  return SvdComplex(A, m, n, U, S, V, 0);
}
// The leading `count` singular triplets.
inline StatusCode SvdLeading(const double* A, int32_t m, int32_t n, int32_t count, double* U,
                             double* S, double* V) {
  return SvdLeadingReal(A, m, n, count, U, S, V);
}
inline StatusCode SvdLeading(const Complex* A, int32_t m, int32_t n, int32_t count, Complex* U,
                             double* S, Complex* V) {
  return SvdLeadingComplex(A, m, n, count, U, S, V);
}
inline StatusCode SvdLeadingRight(const double* A, int32_t m, int32_t n, int32_t count, double* S,
                                  double* V) {
  return SvdLeadingRightReal(A, m, n, count, S, V);
}
inline StatusCode SvdLeadingRight(const Complex* A, int32_t m, int32_t n, int32_t count, double* S,
                                  Complex* V) {
  return SvdLeadingRightComplex(A, m, n, count, S, V);
}
// Pseudo-inverse with tolerance tol, over A's own storage.
inline StatusCode PseudoInverse(double* A, int32_t m, int32_t n, double tol) {
  return PseudoInverseReal(A, m, n, tol, nullptr);
}
inline StatusCode PseudoInverse(Complex* A, int32_t m, int32_t n, double tol) {
  return PseudoInverseComplex(A, m, n, tol, nullptr);
}
// X = pinv(A) B over the `keep` strongest singular components of A.
inline StatusCode TruncatedSolve(const double* A, int32_t m, int32_t n, const double* B, double* X,
                                 int32_t keep) {
  return LeastSquaresTruncatedReal(A, m, n, B, 1, X, keep);
}
inline StatusCode TruncatedSolve(const Complex* A, int32_t m, int32_t n, const Complex* B,
                                 Complex* X, int32_t keep) {
  return LeastSquaresTruncatedComplex(A, m, n, B, 1, X, keep);
}
inline StatusCode HankelProduct(const double* x, int32_t rows, int32_t cols, const double* V,
                                int32_t k, double* Z) {
  return HankelProductReal(x, rows, cols, V, k, Z);
}
inline StatusCode HankelProduct(const Complex* x, int32_t rows, int32_t cols, const Complex* V,
                                int32_t k, Complex* Z) {
  return HankelProductComplex(x, rows, cols, V, k, Z);
}
inline StatusCode ForwardLeastSquares(const double* x, int32_t n, int32_t p, double* w,
                                      double rcond) {
  return ForwardLeastSquaresReal(x, n, p, w, rcond);
}
inline StatusCode ForwardLeastSquares(const Complex* x, int32_t n, int32_t p, Complex* w,
                                      double rcond) {
  return ForwardLeastSquaresComplex(x, n, p, w, rcond);
}
// R of the QR of the forward prediction block of x (m rows, n columns).
inline StatusCode QrReduceHankel(const double* x, int32_t m, int32_t n, double* R) {
  return QrReduceHankelReal(x, m, n, R);
}
inline StatusCode QrReduceHankel(const Complex* x, int32_t m, int32_t n, Complex* R) {
  return QrReduceHankelComplex(x, m, n, R);
}
// Y1's leading triplets and the product with H, by FFT (numeric/krylov.h).
inline StatusCode HankelSvdLeading(const double* x, int32_t rows, int32_t cols, int32_t count,
                                   double* S, double* U, double* V) {
  return HankelSvdLeadingReal(x, rows, cols, count, S, U, V);
}
inline StatusCode HankelSvdLeading(const Complex* x, int32_t rows, int32_t cols, int32_t count,
                                   double* S, Complex* U, Complex* V) {
  return HankelSvdLeadingComplex(x, rows, cols, count, S, U, V);
}
// The forward-backward matrix's leading triplets (numeric/krylov.h).
inline StatusCode ForwardBackwardSvdLeading(const double* x, int32_t n, int32_t p, int32_t count,
                                            double* S, double* U, double* V) {
  return ForwardBackwardSvdLeadingReal(x, n, p, count, S, U, V);
}
inline StatusCode ForwardBackwardSvdLeading(const Complex* x, int32_t n, int32_t p, int32_t count,
                                            double* S, Complex* U, Complex* V) {
  return ForwardBackwardSvdLeadingComplex(x, n, p, count, S, U, V);
}
// Non-zero when any value is a NaN or an infinity.
inline bool HasNonFinite(const double* x, int64_t n) { return HasNonFiniteReal(x, n) != 0; }
inline bool HasNonFinite(const Complex* x, int64_t n) { return HasNonFiniteComplex(x, n) != 0; }
inline StatusCode HankelProductFft(const double* x, int32_t rows, int32_t cols, const double* V,
                                   int32_t k, double* Z) {
  return HankelProductFftReal(x, rows, cols, V, k, Z);
}
inline StatusCode HankelProductFft(const Complex* x, int32_t rows, int32_t cols, const Complex* V,
                                   int32_t k, Complex* Z) {
  return HankelProductFftComplex(x, rows, cols, V, k, Z);
}
// Eigenvalues only of a general matrix; the matrix is left as it is.
inline StatusCode EigenvaluesOf(double* A, int32_t n, Complex* eigenvalues) {
  return EigGeneralReal(A, n, 0, eigenvalues, nullptr);
}
inline StatusCode EigenvaluesOf(Complex* A, int32_t n, Complex* eigenvalues) {
  return EigGeneralComplex(A, n, 0, eigenvalues, nullptr);
}

// ---- estimation building blocks -------------------------------------------------------
inline StatusCode BuildForward(const double* x, int32_t n, int32_t p, double* b, double* A) {
  return BuildForwardMatrixReal(x, n, p, b, A);
}
inline StatusCode BuildForward(const Complex* x, int32_t n, int32_t p, Complex* b, Complex* A) {
  return BuildForwardMatrixComplex(x, n, p, b, A);
}
inline StatusCode BuildBackward(const double* x, int32_t n, int32_t p, double* b, double* A) {
  return BuildBackwardMatrixReal(x, n, p, b, A);
}
inline StatusCode BuildBackward(const Complex* x, int32_t n, int32_t p, Complex* b, Complex* A) {
  return BuildBackwardMatrixComplex(x, n, p, b, A);
}
inline StatusCode Reverse(const double* src, double* dst, int32_t count) {
  return ReverseReal(src, dst, count);
}
inline StatusCode Reverse(const Complex* src, Complex* dst, int32_t count) {
  return ReverseComplex(src, dst, count);
}
inline StatusCode Difference(const double* u, const double* v, int32_t count, double* out) {
  return VecSubReal(u, v, count, out);
}
inline StatusCode Difference(const Complex* u, const Complex* v, int32_t count, Complex* out) {
  return VecSubComplex(u, v, count, out);
}
inline StatusCode ScaleRowsByInverse(double* A, int32_t rows, int32_t cols, const double* s) {
  return ScaleRowsByInverseReal(A, rows, cols, s);
}
inline StatusCode ScaleRowsByInverse(Complex* A, int32_t rows, int32_t cols, const double* s) {
  return ScaleRowsByInverseComplex(A, rows, cols, s);
}

// ---- estimators used by other estimators --------------------------------------------------
inline StatusCode ModeAmplitudes(const double* x, int32_t n, const Complex* z, int32_t k,
                                 Complex* A, double* E) {
  return ModeAmplitudesReal(x, n, z, k, A, E);
}
inline StatusCode ModeAmplitudes(const Complex* x, int32_t n, const Complex* z, int32_t k,
                                 Complex* A, double* E) {
  return ModeAmplitudesComplex(x, n, z, k, A, E);
}
inline StatusCode CovarianceAr(const double* x, int32_t n, int32_t p, double* a, Complex* r,
                               double* variance) {
  return CovarianceArReal(x, n, p, a, r, variance);
}
inline StatusCode CovarianceAr(const Complex* x, int32_t n, int32_t p, Complex* a, Complex* r,
                               double* variance) {
  return CovarianceArComplex(x, n, p, a, r, variance);
}
inline StatusCode PcarEstimate(const double* x, int32_t n, int32_t p, int32_t k, double* a,
                               Complex* roots) {
  return PcarEstimateReal(x, n, p, k, a, roots);
}
inline StatusCode PcarEstimate(const Complex* x, int32_t n, int32_t p, int32_t k, Complex* a,
                               Complex* roots) {
  return PcarEstimateComplex(x, n, p, k, a, roots);
}
inline StatusCode PencilMatrix(const double* x, int32_t n, int32_t L, int32_t M, double* K) {
  return PencilMatrixReal(x, n, L, M, K);
}
inline StatusCode PencilMatrix(const Complex* x, int32_t n, int32_t L, int32_t M, Complex* K) {
  return PencilMatrixComplex(x, n, L, M, K);
}

}  // namespace twin
