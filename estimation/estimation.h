// Time-series model estimators, each in a real and a complex form. Inputs are
// aligned element arrays (the entry points copy host data into aligned work
// memory); every routine returns a StatusCode (core/types.h). Count outputs
// (int32_t* count) receive the number of reported modes, and stand before the
// fit-error outputs, as on the faces.
//
// The estimators take checked arguments: every face runs the checks of
// estimation/entry_checks.h first, and a debug build asserts them here again.
#pragma once

#include <cstdint>

#include "core/types.h"

// ---- linear-prediction building blocks -------------------------------------------
// Forward block, q = n - p rows: A[i][j] = x[i+p-1-j], b[i] = x[i+p].
StatusCode BuildForwardMatrixReal(const double* x, int32_t n, int32_t p, double* b, double* A);
StatusCode BuildForwardMatrixComplex(const Complex* x, int32_t n, int32_t p, Complex* b,
                                     Complex* A);
// Backward block, q rows: A[i][j] = x[i+1+j], b[i] = x[i] (no conjugation).
StatusCode BuildBackwardMatrixReal(const double* x, int32_t n, int32_t p, double* b, double* A);
StatusCode BuildBackwardMatrixComplex(const Complex* x, int32_t n, int32_t p, Complex* b,
                                      Complex* A);
// dst[k] = src[count-1-k].
StatusCode ReverseReal(const double* src, double* dst, int32_t count);
StatusCode ReverseComplex(const Complex* src, Complex* dst, int32_t count);
// out[i] = u[i] - v[i].
StatusCode VecSubComplex(const Complex* u, const Complex* v, int32_t count, Complex* out);

// ---- covariance-method AR ----------------------------------------------------------
// a: p+1 coefficients (a[0] = 1), r: p complex poles, variance: one double.
[[nodiscard]] StatusCode CovarianceArReal(const double* x, int32_t n, int32_t p, double* a,
                                          Complex* r, double* variance);
[[nodiscard]] StatusCode CovarianceArComplex(const Complex* x, int32_t n, int32_t p, Complex* a,
                                             Complex* r, double* variance);

// ---- exponential modes ---------------------------------------------------------------
// Least-squares amplitudes A (k complex) of poles z for x, and the mean squared
// fitting error E.
[[nodiscard]] StatusCode ModeAmplitudesComplex(const Complex* x, int32_t n, const Complex* z,
                                               int32_t k, Complex* A, double* E);
[[nodiscard]] StatusCode ModeAmplitudesReal(const double* x, int32_t n, const Complex* z, int32_t k,
                                            Complex* A, double* E);
// Amplitude, phase, damping (per sample), frequency (Hz) per reported mode.
StatusCode ModeParameters(const Complex* A, int32_t kA, const Complex* z, int32_t kz, double fs,
                          int32_t realFlag, double* amp, double* phase, double* damp, double* freq,
                          int32_t* count);

// ---- Prony ------------------------------------------------------------------------------
[[nodiscard]] StatusCode PronyComplex(const Complex* x, int32_t n, int32_t p, double fs,
                                      double* amp, double* phase, double* damp, double* freq,
                                      int32_t* count);
[[nodiscard]] StatusCode PronyReal(const double* x, int32_t n, int32_t p, double fs,
                                   int32_t realFlag, double* amp, double* phase, double* damp,
                                   double* freq, int32_t* count);

// ---- principal-component AR ------------------------------------------------------------
[[nodiscard]] StatusCode PcarEstimateReal(const double* x, int32_t n, int32_t p, int32_t k,
                                          double* a, Complex* roots);
[[nodiscard]] StatusCode PcarEstimateComplex(const Complex* x, int32_t n, int32_t p, int32_t k,
                                             Complex* a, Complex* roots);
// The route of the truncated solve, as the pencil's (PencilSolver below):
// kDense forms the 2q x p forward-backward matrix and takes its SVD (the
// fit above); kKrylov forms neither and takes its k + 1 leading triplets by
// Lanczos over FFT products (numeric/krylov.h), for long records and large
// orders: the same coefficients to rounding wherever the k-th singular value
// stands clear of the next. kAuto takes whichever PcarPrefersKrylov says is
// cheaper.
enum class PencilSolver : int32_t;
using PcarSolver = PencilSolver;
// True when the Krylov route's estimated time is under half the dense one's
// and k is at most p/4 (where the dense route stays, its numbers are the
// reference).
bool PcarPrefersKrylov(int32_t n, int32_t p, int32_t k, bool complex);
[[nodiscard]] StatusCode PcarSolverReal(const double* x, int32_t n, int32_t p, int32_t k,
                                        PcarSolver solver, double* a, Complex* roots);
[[nodiscard]] StatusCode PcarSolverComplex(const Complex* x, int32_t n, int32_t p, int32_t k,
                                           PcarSolver solver, Complex* a, Complex* roots);
[[nodiscard]] StatusCode PcarThresholdReal(const double* A, int32_t rows, int32_t cols, int32_t k,
                                           double* tau);
[[nodiscard]] StatusCode PcarThresholdComplex(const Complex* A, int32_t rows, int32_t cols,
                                              int32_t k, double* tau);

// ---- matrix pencil ---------------------------------------------------------------------
// Reduced pencil matrix into K (capacity M*M).
[[nodiscard]] StatusCode PencilMatrixReal(const double* x, int32_t n, int32_t L, int32_t M,
                                          double* K);
[[nodiscard]] StatusCode PencilMatrixComplex(const Complex* x, int32_t n, int32_t L, int32_t M,
                                             Complex* K);
[[nodiscard]] StatusCode MatrixPencilReal(const double* x, int32_t n, int32_t L, int32_t M,
                                          double fs, int32_t realFlag, double* amp, double* phase,
                                          double* damp, double* freq, int32_t* count, double* mse);
[[nodiscard]] StatusCode MatrixPencilComplex(const Complex* x, int32_t n, int32_t L, int32_t M,
                                             double fs, double* amp, double* phase, double* damp,
                                             double* freq, int32_t* count, double* mse);
// How the pencil gets Y1's leading triplets: kDense forms Y1 and Y2 and
// decomposes Y1 (the fit above); kKrylov forms neither and takes the triplets
// by Lanczos over FFT products (numeric/krylov.h), for long records: the same
// poles to rounding wherever Y1's M-th singular value stands clear of the
// next. kAuto takes whichever PencilPrefersKrylov says is cheaper.
enum class PencilSolver : int32_t { kAuto = 0, kDense = 1, kKrylov = 2 };
// True when the Krylov route's estimated time is under half the dense one's
// and M is at most L/4 (where the dense route stays, its numbers are the
// reference).
bool PencilPrefersKrylov(int32_t n, int32_t L, int32_t M, bool complex);
[[nodiscard]] StatusCode MatrixPencilSolverReal(const double* x, int32_t n, int32_t L, int32_t M,
                                                double fs, int32_t realFlag, PencilSolver solver,
                                                double* amp, double* phase, double* damp,
                                                double* freq, int32_t* count, double* mse);
[[nodiscard]] StatusCode MatrixPencilSolverComplex(const Complex* x, int32_t n, int32_t L,
                                                   int32_t M, double fs, PencilSolver solver,
                                                   double* amp, double* phase, double* damp,
                                                   double* freq, int32_t* count, double* mse);

// ---- minimum description length ------------------------------------------------------------
[[nodiscard]] StatusCode MdlOrderReal(const double* x, int32_t n, int32_t L, int32_t minOrder,
                                      int32_t* order);
[[nodiscard]] StatusCode MdlOrderComplex(const Complex* x, int32_t n, int32_t L, int32_t minOrder,
                                         int32_t* order);
// The same search with every candidate's amplitudes fitted in full (the forms
// above pass over, unfitted, the candidates a bounded fast score rules out):
// the reference they must agree with, for tests and benchmarks.
[[nodiscard]] StatusCode MdlOrderFullReal(const double* x, int32_t n, int32_t L, int32_t minOrder,
                                          int32_t* order);
[[nodiscard]] StatusCode MdlOrderFullComplex(const Complex* x, int32_t n, int32_t L,
                                             int32_t minOrder, int32_t* order);

// ---- parametric power spectra -----------------------------------------------------------------
struct SpectrumResult {
  double f0;       // frequency of values[0] (-fs/2)
  double df;       // grid step fs / L
  double* values;  // L spectrum values in dB, owned by the caller
};
// -1 for x <= 0, else the largest e with 2^e <= x.
int32_t IntLog2(int32_t x);
// Spectrum length for m requested points: the smallest power of two >= m.
int32_t SpectrumLength(int32_t m);
[[nodiscard]] StatusCode CovPowerSpectrumComplex(const Complex* x, int32_t n, int32_t p, int32_t N,
                                                 double fs, SpectrumResult* result,
                                                 double* variance);
[[nodiscard]] StatusCode CovPowerSpectrumReal(const double* x, int32_t n, int32_t p, int32_t N,
                                              double fs, SpectrumResult* result, double* variance);
[[nodiscard]] StatusCode PcarPowerSpectrumComplex(const Complex* x, int32_t n, int32_t p, int32_t k,
                                                  int32_t N, double fs, double* amp, double* phase,
                                                  double* freq, int32_t* count,
                                                  SpectrumResult* result, double* fitError);
[[nodiscard]] StatusCode PcarPowerSpectrumReal(const double* x, int32_t n, int32_t p, int32_t k,
                                               int32_t N, double fs, int32_t realFlag, double* amp,
                                               double* phase, double* freq, int32_t* count,
                                               SpectrumResult* result, double* fitError);
[[nodiscard]] StatusCode ArSpectrumComplex(Complex* a, int32_t m, int32_t recip, double fs,
                                           int32_t N, int32_t mode, SpectrumResult* result);
[[nodiscard]] StatusCode ArSpectrumReal(double* a, int32_t m, int32_t recip, double fs, int32_t N,
                                        int32_t mode, SpectrumResult* result);
[[nodiscard]] StatusCode SelectRootsNearUnitCircle(const Complex* z, int32_t p, int32_t k,
                                                   Complex* out);
[[nodiscard]] StatusCode RotateReal(double* x, int32_t L, int32_t s);
[[nodiscard]] StatusCode NormalizeByPeak(double* in, int32_t L, double* out, double* peak);
