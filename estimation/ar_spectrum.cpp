// AR power spectra: the shape 1/|A(f)|^2 of an AR coefficient vector on a
// uniform two-sided grid, by a zero-padded FFT of the coefficients, rotated so
// that frequency runs from -fs/2 upward, peak-normalised and in dB; and the
// small routines around it (root selection, circular rotation, peak scaling).
//
// Grid: value j (0 <= j < L) belongs to f0 + j*df with f0 = -fs/2 and
// df = fs/L, so index L/2 is DC and index 0 the Nyquist bin.
#include <cmath>
#include <cstring>

#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "fft/fft.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

// ============================================================================
// Small routines
// ============================================================================

StatusCode RotateReal(double* x, int32_t L, int32_t s) {
  if (L < 0 || s < 0 || s > L) return status::kBadSize;
  // The scratch is taken even for s = 0, so a shift never succeeds where
  // memory is short.
  WorkArray<double> saved = AllocWork<double>(static_cast<size_t>(s));
  if (!saved) return status::kNoMemory;
  if (s == 0) return status::kOk;
  const size_t keep = static_cast<size_t>(L - s), shift = static_cast<size_t>(s);
  std::memcpy(saved.get(), x + keep, shift * sizeof(double));
  std::memmove(x + shift, x, keep * sizeof(double));
  std::memcpy(x, saved.get(), shift * sizeof(double));
  return status::kOk;
}

StatusCode NormalizeByPeak(double* in, int32_t L, double* out, double* peak) {
  if (L < 1) return status::kBadSize;
  if (out == nullptr) out = in;
  // NaN never wins the comparison; an infinite peak turns the peak bin into
  // NaN (inf * 0) and every finite value into 0.
  double largest = 0.0;
  for (int32_t i = 0; i < L; ++i)
    if (std::fabs(in[i]) > largest) largest = std::fabs(in[i]);
  if (largest == 0.0) {
    if (out != in) std::memcpy(out, in, static_cast<size_t>(L) * sizeof(double));
  } else {
    const double scale = 1.0 / largest;
    for (int32_t i = 0; i < L; ++i) out[i] = in[i] * scale;
  }
  *peak = largest;
  return status::kOk;
}

StatusCode SelectRootsNearUnitCircle(const Complex* z, int32_t p, int32_t k, Complex* out) {
  if (p < 0 || k < 0) return status::kBadSize;
  WorkArray<double> d = AllocWork<double>(static_cast<size_t>(p));
  if (!d) return status::kNoMemory;
  for (int32_t i = 0; i < p; ++i) {
    const double re = z[i].real(), im = z[i].imag();
    d[i] = std::fabs(std::sqrt(re * re + im * im) - 1.0);
  }
  double dmax = 0.0, dmin = 0.0;
  int32_t imax = -1, imin = -1;
  StatusCode st = MinMaxReal(d.get(), p, &dmax, &imax, &dmin, &imin);
  if (st != status::kOk) return st;
  for (int32_t j = 0; j < k; ++j) out[j] = Complex(0.0, 0.0);
  // A chosen root is masked with the largest distance, not with infinity: when
  // every remaining distance equals that largest one, the first root of them
  // (possibly one already chosen) is taken again.
  for (int32_t j = 0; j < k; ++j) {
    st = MinMaxReal(d.get(), p, &dmax, &imax, &dmin, &imin);
    if (st != status::kOk) return st;
    if (imin < 0) break;  // every distance NaN: nothing to choose
    out[j] = z[imin];
    d[imin] = dmax;
  }
  return status::kOk;
}

// ============================================================================
// Evaluators
// ============================================================================

namespace {

constexpr int32_t kNoWindow = 3;

// Window kind of a window mode, or -1 for a mode outside 0..3 (3: none).
int32_t WindowKindOfMode(int32_t mode) {
  static constexpr int32_t kKinds[] = {5, 1, 2, 0};
  return (mode < 0 || mode > kNoWindow) ? -1 : kKinds[mode];
}

void WindowInPlace(double* x, int32_t m, int32_t mode) {
  if (mode == kNoWindow) return;
  // A window failure (m < 1) leaves x as it was: the spectrum is then that of
  // the unwindowed coefficients.
  (void)ApplyWindow(x, m, WindowKindOfMode(mode), 0);
}

// Common tail of both evaluators on the rotated power P (L values):
// reciprocal, peak normalisation into result->values, dB, grid.
StatusCode FinishSpectrum(double* P, int32_t L, int32_t recip, double fs, SpectrumResult* result) {
  if (recip != 0)
    for (int32_t i = 0; i < L; ++i) P[i] = 1.0 / P[i];  // a zero power gives +inf
  double peak = 0.0;
  const StatusCode st = NormalizeByPeak(P, L, result->values, &peak);
  if (st != status::kOk) return st;
  // No floor: a zero value is -inf dB, a NaN stays NaN.
  for (int32_t i = 0; i < L; ++i) result->values[i] = 10.0 * std::log10(result->values[i]);
  result->f0 = fs * -0.5;
  result->df = fs / L;
  return status::kOk;
}

// Releases a plan on every path out of the complex evaluator.
struct PlanHolder {
  FftPlan* plan;
  ~PlanHolder() { FftPlanRelease(plan); }
};

// Complex coefficients: windowed part by part, transformed by the complex FFT.
StatusCode ComplexSpectrum(Complex* a, int32_t m, int32_t recip, double fs, int32_t N, int32_t mode,
                           SpectrumResult* result) {
  if (m < 1) return status::kBadSize;
  const size_t mm = static_cast<size_t>(m);
  WorkArray<double> re = AllocWork<double>(mm), im = AllocWork<double>(mm);
  if (!re || !im) return status::kNoMemory;
  if (WindowKindOfMode(mode) < 0) return status::kBadOption;

  // The window is applied to the real and imaginary parts separately, and the
  // windowed coefficients are left in a.
  for (size_t i = 0; i < mm; ++i) {
    re[i] = a[i].real();
    im[i] = a[i].imag();
  }
  WindowInPlace(re.get(), m, mode);
  WindowInPlace(im.get(), m, mode);
  for (size_t i = 0; i < mm; ++i) a[i] = Complex(re[i], im[i]);

  const int32_t L = SpectrumLength(N);
  if (L < 1) return status::kBadSize;
  const size_t LL = static_cast<size_t>(L);
  WorkArray<Complex> in = AllocWork<Complex>(LL), out = AllocWork<Complex>(LL);
  WorkArray<double> P = AllocWork<double>(LL);
  if (!in || !out || !P) return status::kNoMemory;
  // As in the real evaluator, coefficients beyond L wrap by assignment: a
  // later one replaces an earlier one in the same slot.
  for (size_t i = 0; i < mm; ++i) in[i % LL] = a[i];

  PlanHolder plan{FftPlanAcquire(L)};
  if (plan.plan == nullptr) return status::kNoMemory;
  double* inD = reinterpret_cast<double*>(in.get());
  double* outD = reinterpret_cast<double*>(out.get());
  StatusCode st = FftComplex(plan.plan, inD, inD + 1, outD, outD + 1, 2, 2, L);
  if (st != status::kOk) return st;

  for (size_t i = 0; i < LL; ++i) {
    const double r = out[i].real(), j = out[i].imag();
    P[i] = r * r + j * j;
  }
  // Bin (j - L/2) mod L moves to index j: frequency runs from -fs/2.
  st = RotateReal(P.get(), L, L / 2);
  if (st != status::kOk) return st;
  return FinishSpectrum(P.get(), L, recip, fs, result);
}

// Real coefficients: the real power spectrum.
StatusCode RealSpectrum(double* a, int32_t m, int32_t recip, double fs, int32_t N, int32_t mode,
                        SpectrumResult* result) {
  if (m < 1) return status::kBadSize;
  if (WindowKindOfMode(mode) < 0) return status::kBadOption;
  WindowInPlace(a, m, mode);

  const int32_t L = SpectrumLength(N);
  if (L < 1) return status::kBadSize;
  WorkArray<double> buffer = AllocWork<double>(static_cast<size_t>(L));
  if (!buffer) return status::kNoMemory;
  // Coefficients beyond L wrap by assignment: a later one replaces an earlier
  // one in the same slot rather than adding to it.
  for (int32_t i = 0; i < m; ++i) buffer[i % L] = a[i];

  // |X[k]|^2 / L^2, two-sided; the 1/L^2 cancels in the normalisation.
  StatusCode st = PowerSpectrumReal(buffer.get(), L);
  if (st != status::kOk) return st;
  // The only failure of the rotation is its scratch allocation; an
  // unrotated spectrum would be silently wrong, so it is reported.
  st = RotateReal(buffer.get(), L, L / 2);
  if (st != status::kOk) return st;
  return FinishSpectrum(buffer.get(), L, recip, fs, result);
}

}  // namespace

template <typename T>
StatusCode ArSpectrum(T* a, int32_t m, int32_t recip, double fs, int32_t N, int32_t mode,
                      SpectrumResult* result) {
  if constexpr (kIsComplex<T>) {
    return ComplexSpectrum(a, m, recip, fs, N, mode, result);
  } else {
    return RealSpectrum(a, m, recip, fs, N, mode, result);
  }
}
template StatusCode ArSpectrum(double*, int32_t, int32_t, double, int32_t, int32_t,
                               SpectrumResult*);
template StatusCode ArSpectrum(Complex*, int32_t, int32_t, double, int32_t, int32_t,
                               SpectrumResult*);

StatusCode ArSpectrumComplex(Complex* a, int32_t m, int32_t recip, double fs, int32_t N,
                             int32_t mode, SpectrumResult* result) {
  return ArSpectrum(a, m, recip, fs, N, mode, result);
}
StatusCode ArSpectrumReal(double* a, int32_t m, int32_t recip, double fs, int32_t N, int32_t mode,
                          SpectrumResult* result) {
  return ArSpectrum(a, m, recip, fs, N, mode, result);
}
