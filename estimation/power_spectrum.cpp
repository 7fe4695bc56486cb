// Parametric power spectra of a data record: an AR model by the covariance
// method or by principal components, evaluated on the spectrum grid
// (ar_spectrum.cpp). The PCAR form also reports the modes of the roots
// nearest the unit circle. The drivers always ask for the reciprocal power
// and no window.
#include <cassert>

#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/work.h"

namespace {

constexpr int32_t kReciprocal = 1;
constexpr int32_t kNoWindow = 3;

template <typename T>
StatusCode CovPowerSpectrum(const T* x, int32_t n, int32_t p, int32_t N, double fs,
                            SpectrumResult* result, double* variance) {
  // N is the power of two the checked size m became, so it passes as m.
  assert(checks::CovSpectrum(n, p, N, fs, checks::Bound::kWide) == status::kOk);

  const size_t order = static_cast<size_t>(p);
  WorkArray<T> a = AllocWork<T>(order + 1);
  WorkArray<Complex> poles = AllocWork<Complex>(order);
  if (!a || !poles) return status::kNoMemory;

  // An order of 0 passes the spectrum's checks, and the outputs are sized for
  // it; the covariance fit has no model of order 0 and refuses it, here, after
  // the work memory, where the fit would.
  if (p == 0) return status::kBadCount;
  const StatusCode st = CovarianceAr(x, n, p, a.get(), poles.get(), variance);
  if (st != status::kOk) return st;
  return ArSpectrum(a.get(), p + 1, kReciprocal, fs, N, kNoWindow, result);
}

template <typename T>
StatusCode PcarPowerSpectrum(const T* x, int32_t n, int32_t p, int32_t k, int32_t N, double fs,
                             int32_t realFlag, double* amp, double* phase, double* freq,
                             int32_t* count, SpectrumResult* result, double* fitError) {
  assert(checks::PcarSpectrum(n, p, k, N, fs, checks::Bound::kWide) == status::kOk);

  const size_t order = static_cast<size_t>(p), modes = static_cast<size_t>(k);
  WorkArray<T> a = AllocWork<T>(order + 1);
  WorkArray<Complex> roots = AllocWork<Complex>(order);
  WorkArray<Complex> selected = AllocWork<Complex>(modes);
  WorkArray<Complex> amplitudes = AllocWork<Complex>(modes);
  WorkArray<double> damping = AllocWork<double>(modes);  // computed, not reported
  if (!a || !roots || !selected || !amplitudes || !damping) return status::kNoMemory;

  StatusCode st = PcarEstimate(x, n, p, k, a.get(), roots.get());
  if (st != status::kOk) return st;
  st = SelectRootsNearUnitCircle(roots.get(), p, k, selected.get());
  if (st != status::kOk) return st;
  st = ModeAmplitudes(x, n, selected.get(), k, amplitudes.get(), fitError);
  if (st != status::kOk) return st;
  st = ModeParameters(amplitudes.get(), k, selected.get(), k, fs, realFlag, amp, phase,
                      damping.get(), freq, count);
  if (st != status::kOk) return st;
  return ArSpectrum(a.get(), p + 1, kReciprocal, fs, N, kNoWindow, result);
}

}  // namespace

StatusCode CovPowerSpectrumComplex(const Complex* x, int32_t n, int32_t p, int32_t N, double fs,
                                   SpectrumResult* result, double* variance) {
  return CovPowerSpectrum(x, n, p, N, fs, result, variance);
}

StatusCode CovPowerSpectrumReal(const double* x, int32_t n, int32_t p, int32_t N, double fs,
                                SpectrumResult* result, double* variance) {
  return CovPowerSpectrum(x, n, p, N, fs, result, variance);
}

StatusCode PcarPowerSpectrumComplex(const Complex* x, int32_t n, int32_t p, int32_t k, int32_t N,
                                    double fs, double* amp, double* phase, double* freq,
                                    int32_t* count, SpectrumResult* result, double* fitError) {
  // Complex data have no conjugate pairs to fold: every selected mode is reported.
  return PcarPowerSpectrum(x, n, p, k, N, fs, 0, amp, phase, freq, count, result, fitError);
}

StatusCode PcarPowerSpectrumReal(const double* x, int32_t n, int32_t p, int32_t k, int32_t N,
                                 double fs, int32_t realFlag, double* amp, double* phase,
                                 double* freq, int32_t* count, SpectrumResult* result,
                                 double* fitError) {
  return PcarPowerSpectrum(x, n, p, k, N, fs, realFlag, amp, phase, freq, count, result, fitError);
}
