// Exponential modes: least-squares amplitudes of a set of poles against a
// record, x[t] ~ sum_i A_i z_i^t, and the conversion of poles and amplitudes
// into amplitude, phase, damping (per sample) and frequency (Hz).
#include <cmath>
#include <cstddef>

#include "core/scalar.h"
#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

constexpr double kTwoPi = 6.283185307179586;
constexpr double kPi = 3.141592653589793;

}  // namespace

// Fits the k amplitudes A of poles z to the n samples x and reports the mean
// squared modulus of the residual in E. The solve, product and difference are
// not checked: if one of them fails, A and E are whatever it left behind.
template <typename T>
StatusCode ModeAmplitudes(const T* x, int32_t n, const Complex* z, int32_t k, Complex* A,
                          double* E) {
  if constexpr (kIsComplex<T>) {
    // The real form trusts its callers (n >= 1, k >= 1); only the complex one
    // checks its arguments.
    if (n < 1) return status::kEmptyInput;
    if (k <= 0) return status::kNoModes;
  }
  const size_t rows = static_cast<size_t>(n);
  const size_t cols = static_cast<size_t>(k);
  const size_t cells = (rows != 0 && cols > SIZE_MAX / rows) ? SIZE_MAX : rows * cols;

  WorkArray<Complex> V = AllocWorkUninit<Complex>(cells);
  if (!V) return status::kNoMemory;
  WorkArray<Complex> data = AllocWorkUninit<Complex>(rows);
  if (!data) return status::kNoMemory;
  WorkArray<Complex> model = AllocWorkUninit<Complex>(rows);
  if (!model) return status::kNoMemory;
  WorkArray<Complex> residual = AllocWorkUninit<Complex>(rows);
  if (!residual) return status::kNoMemory;

  // Vandermonde matrix V[t][i] = z_i^t by running products down each column:
  // no power function, so every entry is the exact product chain. The chains
  // advance together, a row at a time, so V is written in order. The product
  // is spelled out: std::complex's operator adds a NaN-recovery call per entry.
  for (size_t i = 0; i < cols; ++i) V[i] = Complex(1.0, 0.0);
  for (size_t t = 1; t < rows; ++t) {
    const Complex* prev = V.get() + (t - 1) * cols;
    Complex* row = V.get() + t * cols;
    for (size_t i = 0; i < cols; ++i) {
      const double re = prev[i].real(), im = prev[i].imag();
      const double zr = z[i].real(), zi = z[i].imag();
      row[i] = Complex(re * zr - im * zi, re * zi + im * zr);
    }
  }

  // Real samples go into the real parts; the amplitudes stay complex.
  for (size_t t = 0; t < rows; ++t) data[t] = Complex(RealPart(x[t]), ImagPart(x[t]));

  (void)LeastSquares(V.get(), n, k, data.get(), 1, A, -1.0);
  (void)MatMul(V.get(), A, n, k, 1, model.get());
  (void)VecSubComplex(model.get(), data.get(), n, residual.get());

  double sum = 0.0;
  for (size_t t = 0; t < rows; ++t) sum += AbsSquared(residual[t]);
  *E = sum / static_cast<double>(n);
  return status::kOk;
}
template StatusCode ModeAmplitudes(const double*, int32_t, const Complex*, int32_t, Complex*,
                                   double*);
template StatusCode ModeAmplitudes(const Complex*, int32_t, const Complex*, int32_t, Complex*,
                                   double*);

StatusCode ModeAmplitudesComplex(const Complex* x, int32_t n, const Complex* z, int32_t k,
                                 Complex* A, double* E) {
  return ModeAmplitudes(x, n, z, k, A, E);
}
StatusCode ModeAmplitudesReal(const double* x, int32_t n, const Complex* z, int32_t k, Complex* A,
                              double* E) {
  return ModeAmplitudes(x, n, z, k, A, E);
}

// Complex mode reports every pole in order. Real-signal mode reports one
// member of each conjugate pair, the one with 0 <= angle < pi: a real positive
// pole is kept, a real negative one (angle pi) dropped, and the amplitude is
// that member's own |A_i|, not doubled. Damping is ln|z| unguarded, so a pole
// at 0 gives -inf.
StatusCode ModeParameters(const Complex* A, int32_t kA, const Complex* z, int32_t kz, double fs,
                          int32_t realFlag, double* amp, double* phase, double* damp, double* freq,
                          int32_t* count) {
  const double scale = fs / kTwoPi;
  if (realFlag == 0) {
    for (int32_t i = 0; i < kz; ++i) {
      double m = 0.0;
      double theta = 0.0;
      (void)ComplexToPolar(z[i].real(), z[i].imag(), &m, &theta);
      freq[i] = theta * scale;
      damp[i] = std::log(m);
    }
    for (int32_t i = 0; i < kA; ++i) {
      (void)ComplexToPolar(A[i].real(), A[i].imag(), &amp[i], &phase[i]);
    }
    *count = kz;
    return status::kOk;
  }
  int32_t j = 0;
  for (int32_t i = 0; i < kz; ++i) {
    double m = 0.0;
    double theta = 0.0;
    (void)ComplexToPolar(z[i].real(), z[i].imag(), &m, &theta);
    if (!(theta >= 0.0 && theta < kPi)) continue;
    damp[j] = std::log(m);
    freq[j] = theta * scale;
    (void)ComplexToPolar(A[i].real(), A[i].imag(), &amp[j], &phase[j]);
    ++j;
  }
  *count = j;
  return status::kOk;
}
