// Prony method: a record as a sum of p damped complex exponentials. The poles
// are the roots of a covariance-method AR model of order p, the amplitudes a
// least-squares fit of those poles to the record; each mode is then reported
// as amplitude, phase, damping and frequency.
#include <cassert>
#include <cstddef>

#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/work.h"

namespace {

// realFlag selects real-signal reporting (one mode per conjugate pair); the
// complex form always passes 0.
template <typename T>
StatusCode Prony(const T* x, int32_t n, int32_t p, double fs, int32_t realFlag, double* amp,
                 double* phase, double* damp, double* freq, int32_t* count) {
  assert(checks::Prony(n, p, fs, checks::Bound::kWide) == status::kOk);

  const size_t modes = static_cast<size_t>(p);
  WorkArray<T> coefficients = AllocWork<T>(modes + 1);
  if (!coefficients) return status::kNoMemory;
  WorkArray<Complex> poles = AllocWork<Complex>(modes);
  if (!poles) return status::kNoMemory;
  WorkArray<Complex> amplitudes = AllocWork<Complex>(modes);
  if (!amplitudes) return status::kNoMemory;

  double variance = 0.0;  // not reported
  StatusCode st = CovarianceAr(x, n, p, coefficients.get(), poles.get(), &variance);
  if (st != status::kOk) return st;
  double fit_error = 0.0;  // not reported
  st = ModeAmplitudes(x, n, poles.get(), p, amplitudes.get(), &fit_error);
  if (st != status::kOk) return st;
  return ModeParameters(amplitudes.get(), p, poles.get(), p, fs, realFlag, amp, phase, damp, freq,
                        count);
}

}  // namespace

StatusCode PronyComplex(const Complex* x, int32_t n, int32_t p, double fs, double* amp,
                        double* phase, double* damp, double* freq, int32_t* count) {
  return Prony<Complex>(x, n, p, fs, 0, amp, phase, damp, freq, count);
}
StatusCode PronyReal(const double* x, int32_t n, int32_t p, double fs, int32_t realFlag,
                     double* amp, double* phase, double* damp, double* freq, int32_t* count) {
  return Prony<double>(x, n, p, fs, realFlag, amp, phase, damp, freq, count);
}
