// Standard errors of fitted exponential modes: the square roots of the
// diagonal of the Cramer-Rao bound of the mode model, evaluated at the modes
// given and with the noise variance estimated from their residual.
//
// Complex data: x[t] = sum_i a_i e^{j phi_i} e^{(alpha_i + j w_i) t} in
// complex white noise, four real parameters per mode; the noise variance s2
// (per complex sample, E|e|^2) is ||x - model||^2 / (n - 2M), and the
// covariance of the parameters is (s2 / 2) [Re(D^H D)]^-1, D the n-by-4M
// Jacobian.
//
// Real data: each mode with a frequency off 0 and fs/2 is a real cosine
// 2 a e^{alpha t} cos(w t + phi) with four parameters; one at 0 or fs/2 is the
// single real term a cos(phi) e^{alpha t} (w = 0 or pi) with two, amplitude
// and damping (its phase and frequency are fixed by the model and get error
// 0). s2 = ||x - model||^2 / (n - P), P the real parameters, and the
// covariance is s2 (D^T D)^-1. With `pairs` the modes are the complex poles
// of a real record (every one reported): each mode off 0 and fs/2 has a
// conjugate partner (opposite frequency, same damping), the pair is one
// cosine of the member with the positive frequency, and the partner gets the
// same errors.
//
// w = 2 pi f / fs: errors come out in the units of the modes, amplitude in
// those of x, phase in radians, damping per sample, frequency in the units of
// fs.
//
// The bound is taken from the singular value decomposition of the Jacobian
// with its columns scaled to unit norm. Directions whose singular value lies
// below kModeBoundRcond times the largest are treated as undetermined; a
// parameter with a weight above kModeBoundLeak in them cannot be bounded, and
// its mode's four errors are NaN with the status kBoundSingular. The other
// parameters' variances come from the determined directions.
#pragma once

#include <cstdint>

#include "core/types.h"

namespace status {
// Warning: the bound is singular or badly conditioned for some modes; their
// errors are NaN, every other value is complete.
constexpr StatusCode kBoundSingular{20002};
// Argument errors of the error bars (mapped as the others to -42400 - code).
constexpr StatusCode kTooFewSamples{24};  // n not above the parameters' count
constexpr StatusCode kBadModes{25};       // a NaN/infinite mode value, or unpaired modes
}  // namespace status

// Smallest singular value of the column-scaled Jacobian, relative to its
// largest, that still counts as determined (the scaled Fisher matrix's
// reciprocal condition number is its square, 1e-14).
constexpr double kModeBoundRcond = 1e-7;
// Squared weight of a parameter in the undetermined directions above which
// its mode's errors are NaN.
constexpr double kModeBoundLeak = 1e-10;
// Relative tolerance on frequency (of fs) and damping (per sample) by which
// two modes of a real record count as a conjugate pair.
constexpr double kModePairTolerance = 1e-7;

// The modes, `count` values per array, and the sampling rate.
struct ModeSet {
  const double* amplitude;
  const double* phase;
  const double* damping;
  const double* frequency;
  int32_t count;
  double fs;
};

// Outputs: `count` errors per array, and the noise variance.
struct ModeStdErrors {
  double* amplitude;
  double* phase;
  double* damping;
  double* frequency;
  double* noiseVariance;
};

// Checks the mode values and counts the model's real parameters before any
// work: kBadModes for a NaN or infinite value (or, real data with pairs, a mode
// without its partner), kTooFewSamples when n does not exceed the count (real)
// or half of it (complex). Writes nothing.
[[nodiscard]] StatusCode ModeErrorsPlan(int32_t n, bool complexData, bool pairs,
                                        const ModeSet& modes, int64_t* parameters);

// The errors. kOk, kBoundSingular, or a numeric failure (kNoMemory, LAPACK's).
// Run ModeErrorsPlan first: these trust its verdict.
[[nodiscard]] StatusCode ModeErrorsComplex(const Complex* x, int32_t n, const ModeSet& modes,
                                           const ModeStdErrors& out);
[[nodiscard]] StatusCode ModeErrorsReal(const double* x, int32_t n, bool pairs,
                                        const ModeSet& modes, const ModeStdErrors& out);

// Work memory of one call, in bytes, for the plain face's bound.
double ModeErrorsWork(int32_t modes);
