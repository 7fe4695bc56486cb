// Spectra as their readers expect them: the frequency axis written out, a
// one-sided layout for real data (0 to fs/2, as a periodogram of real data is
// usually shown), and an AR model's power spectral density in units of x^2/Hz
// beside its peak-normalised dB. The Python package and the tool both lay
// their spectra out here, so the two agree on every bin.
#include <cfloat>
#include <cmath>
#include <cstring>

#include "api/last_error.h"
#include "api/plain_face.h"
#include "core/scalar.h"
#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/work.h"
#include "qdm_api.h"

namespace {

constexpr double kPi = 3.14159265358979323846;
constexpr int32_t kReciprocal = 1;  // the evaluator's 1/|A|^2
constexpr int32_t kNoWindow = 3;
// The evaluator's buffers, the caller's three outputs and the coefficient copy.
constexpr double kWorkPerValue = 48.0 + 24.0;

using plain::Finite;
bool Finite(const Complex& v) { return Finite(v.real()) && Finite(v.imag()); }

// 1/|A(e^{jw})|^2 at w = 2 pi f / fs, by Horner's rule in z^-1.
template <typename T>
double InversePower(const T* a, int32_t order, double f, double fs) {
  const double w = 2.0 * kPi * f / fs;
  const Complex step(std::cos(w), -std::sin(w));
  Complex sum(0.0, 0.0);
  for (int32_t k = order; k >= 0; --k) sum = sum * step + Complex(a[k]);
  return 1.0 / std::norm(sum);
}

int32_t Layout(double* values, double* density, int32_t length, double fs, int32_t onesided,
               double* frequency, int32_t* count) {
  if (values == nullptr) return last_error::Null("spectrum");
  if (frequency == nullptr) return last_error::Null("frequency");
  if (count == nullptr) return last_error::Null("count");
  *count = 0;
  if (length < 2)
    return last_error::Refuse(QDM_ERR_SPECTRUM_SIZE, "length", length, "is below", "2");
  if (length % 2 != 0)
    return last_error::Refuse(QDM_ERR_SPECTRUM_SIZE, "length", length, "is not even");
  if (!Finite(fs)) return last_error::NotFinite("fs", fs);
  if (!(fs > 0.0)) return last_error::Refuse(QDM_ERR_SAMPLE_RATE, "fs", fs, "is not positive");
  const double df = fs / length;
  if (onesided == 0) {
    for (int32_t i = 0; i < length; ++i) frequency[i] = -0.5 * fs + i * df;
    *count = length;
    return QDM_OK;
  }
  // Bin length/2 + k holds frequency k df; bin 0 (-fs/2) is also +fs/2. Every
  // bin but 0 and fs/2 stands for itself and its mirror image, so a density
  // doubles there.
  const int32_t half = length / 2;
  const double nyquistValue = values[0];
  const double nyquistDensity = density != nullptr ? density[0] : 0.0;
  for (int32_t k = 0; k < half; ++k) {
    values[k] = values[half + k];
    if (density != nullptr) density[k] = (k == 0 ? 1.0 : 2.0) * density[half + k];
    frequency[k] = k * df;
  }
  values[half] = nyquistValue;
  if (density != nullptr) density[half] = nyquistDensity;
  frequency[half] = 0.5 * fs;
  *count = half + 1;
  return QDM_OK;
}

template <typename T>
int32_t ArPsd(const T* a, int32_t order, double noise_variance, int32_t points, double fs,
              int32_t onesided, double* frequency, double* spectrum, double* psd, int32_t* count) {
  if (count != nullptr) *count = 0;
  const int32_t N = qdm_spectrum_length(points);
  if (points < 2)
    return last_error::Refuse(QDM_ERR_SPECTRUM_SIZE, "points", points, "is below", "2");
  if (N == 0) {
    return last_error::RefuseAgainst(QDM_ERR_SPECTRUM_SIZE, "points", points, "is above", "2^30",
                                     0x1p30);
  }
  if (order < 0) return last_error::Refuse(QDM_ERR_ORDER, "order", order, "is below", "0");
  if (N < int64_t{order} + 1) {
    return last_error::RefuseAgainst(QDM_ERR_SPECTRUM_TOO_SHORT, "points", points,
                                     "gives fewer spectrum values than", "order + 1", order + 1.0);
  }
  if (!Finite(fs)) return last_error::NotFinite("fs", fs);
  if (!(fs > 0.0)) return last_error::Refuse(QDM_ERR_SAMPLE_RATE, "fs", fs, "is not positive");
  if (onesided != 0 && kIsComplex<T>) {
    return last_error::Refuse(QDM_ERR_OPTION, "onesided", onesided, "is not 0",
                              "for complex coefficients");
  }
  if (kWorkPerValue * N > static_cast<double>(QDM_MAX_WORK_BYTES)) {
    return last_error::WorkLimit(kWorkPerValue * N, -1);
  }
  if (!Finite(noise_variance)) return last_error::NotFinite("noise_variance", noise_variance);
  if (noise_variance < 0.0) {
    return last_error::Refuse(QDM_ERR_OPTION, "noise_variance", noise_variance, "is below", "0");
  }
  // The pointers come after the sizes, so a call with null outputs checks the
  // arguments alone before the caller sets aside room for N values.
  if (a == nullptr) return last_error::Null("a");
  if (frequency == nullptr) return last_error::Null("frequency");
  if (spectrum == nullptr) return last_error::Null("spectrum");
  if (count == nullptr) return last_error::Null("count");
  for (int32_t k = 0; k <= order; ++k) {
    if (!Finite(a[k])) {
      return last_error::NotFiniteSample(reinterpret_cast<const double*>(a),
                                         (order + int64_t{1}) * (kIsComplex<T> ? 2 : 1),
                                         kIsComplex<T>, "a");
    }
  }

  // The evaluator may window its coefficients in place: it gets a copy.
  const size_t m = static_cast<size_t>(order) + 1;
  WorkArray<T> copy = AllocWorkUninit<T>(m);
  if (!copy) return QDM_ERR_NO_MEMORY;
  std::memcpy(static_cast<void*>(copy.get()), a, m * sizeof(T));
  SpectrumResult result{0.0, 0.0, spectrum};
  StatusCode s = ArSpectrum(copy.get(), order + 1, kReciprocal, fs, N, kNoWindow, &result);
  int32_t status = s < 0 || s > 0 ? plain::PublicCode(s) : QDM_OK;
  if (status == QDM_OK && psd != nullptr) {
    // The dB values are 10 log10(P / P_peak): the density is P sigma^2 / fs,
    // with P_peak evaluated at the 0 dB bin.
    int32_t peak = 0;
    for (int32_t i = 1; i < N; ++i)
      if (spectrum[i] > spectrum[peak]) peak = i;
    const double level =
        noise_variance / fs * InversePower(a, order, result.f0 + peak * result.df, fs);
    for (int32_t i = 0; i < N; ++i) psd[i] = level * std::pow(10.0, 0.1 * spectrum[i]);
  }
  if (status == QDM_OK) status = Layout(spectrum, psd, N, fs, onesided, frequency, count);
  for (int32_t i = 0; status == QDM_OK && i < *count; ++i)
    if (!Finite(spectrum[i]) || (psd != nullptr && !Finite(psd[i])))
      status = QDM_ERR_NON_FINITE_RESULT;
  if (status != QDM_OK) {
    std::memset(frequency, 0, sizeof(double) * N);
    std::memset(spectrum, 0, sizeof(double) * N);
    if (psd != nullptr) std::memset(psd, 0, sizeof(double) * N);
    *count = 0;
  }
  return status;
}

}  // namespace

QDM_PLAIN_API int32_t qdm_spectrum_layout(double* spectrum, double* psd, int32_t length, double fs,
                                          int32_t onesided, double* frequency, int32_t* count) {
  last_error::Begin();
  return last_error::End(Layout(spectrum, psd, length, fs, onesided, frequency, count));
}

QDM_PLAIN_API int32_t qdm_ar_psd_real(const double* a, int32_t order, double noise_variance,
                                      int32_t points, double fs, int32_t onesided,
                                      double* frequency, double* spectrum, double* psd,
                                      int32_t* count) {
  last_error::Begin();
  return last_error::End(
      ArPsd(a, order, noise_variance, points, fs, onesided, frequency, spectrum, psd, count));
}

QDM_PLAIN_API int32_t qdm_ar_psd_complex(const qdm_complex* a, int32_t order, double noise_variance,
                                         int32_t points, double fs, int32_t onesided,
                                         double* frequency, double* spectrum, double* psd,
                                         int32_t* count) {
  last_error::Begin();
  return last_error::End(ArPsd(reinterpret_cast<const Complex*>(a), order, noise_variance, points,
                               fs, onesided, frequency, spectrum, psd, count));
}
