// The estimators and their building blocks as templates over the element type
// T (double or Complex), for the estimators that call one another. Internal to
// the estimation layer: the named ...Real / ...Complex forms in estimation.h
// are one-line wrappers over these. Each is instantiated for both types in its
// own .cpp.
#pragma once

#include <cstdint>

#include "core/scalar.h"
#include "core/types.h"
#include "estimation/estimation.h"

// Forward block, q = n - p rows: A[i][j] = x[i+p-1-j], b[i] = x[i+p].
template <typename T>
StatusCode BuildForwardMatrix(const T* x, int32_t n, int32_t p, T* b, T* A);
// Backward block, q rows: A[i][j] = x[i+1+j], b[i] = x[i] (no conjugation).
template <typename T>
StatusCode BuildBackwardMatrix(const T* x, int32_t n, int32_t p, T* b, T* A);
// dst[k] = src[count-1-k]; src == dst reverses in place.
template <typename T>
StatusCode Reverse(const T* src, T* dst, int32_t count);

// Least-squares amplitudes A (k complex) of poles z for x, and the mean squared
// fitting error E.
template <typename T>
[[nodiscard]] StatusCode ModeAmplitudes(const T* x, int32_t n, const Complex* z, int32_t k,
                                        Complex* A, double* E);
// a: p+1 coefficients (a[0] = 1), r: p complex poles, variance: one double.
template <typename T>
[[nodiscard]] StatusCode CovarianceAr(const T* x, int32_t n, int32_t p, T* a, Complex* r,
                                      double* variance);
// a: p+1 coefficients (a[0] = 1), roots: p complex roots; the dense solve.
template <typename T>
[[nodiscard]] StatusCode PcarEstimate(const T* x, int32_t n, int32_t p, int32_t k, T* a,
                                      Complex* roots);
// Reduced pencil matrix into K (capacity M*M); the dense route.
template <typename T>
[[nodiscard]] StatusCode PencilMatrix(const T* x, int32_t n, int32_t L, int32_t M, T* K);
// Row i of the rows-by-cols matrix multiplied by 1 / s[i] (no threshold).
template <typename T>
StatusCode ScaleRowsByInverse(T* A, int32_t rows, int32_t cols, const double* s);
// The AR spectrum of the m coefficients a, as ArSpectrumReal / ArSpectrumComplex.
template <typename T>
[[nodiscard]] StatusCode ArSpectrum(T* a, int32_t m, int32_t recip, double fs, int32_t N,
                                    int32_t mode, SpectrumResult* result);
