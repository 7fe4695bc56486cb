// Error bars of modes on the plain face: the standard errors of any set of
// modes against a record (estimation/mode_errors.h), with this face's order
// of refusals: the argument checks, null pointers, the work bound, non-finite
// samples or rate, the mode values and the degrees of freedom, then the bound.
// A record or amplitude outside [2^-128, 2^128] is worked on scaled by a power
// of two, as the fits do, and the results scaled back.
#include <cfloat>
#include <cmath>
#include <cstring>

#include <utility>

#include "api/last_error.h"
#include "api/plain_face.h"
#include "core/scalar.h"
#include "core/types.h"
#include "estimation/entry_checks.h"
#include "estimation/mode_errors.h"
#include "numeric/work.h"
#include "qdm_api.h"

namespace {

static_assert(int32_t(status::kBoundSingular) == QDM_WARN_BOUND_SINGULAR);
static_assert(-42400 - int32_t(status::kTooFewSamples) == QDM_ERR_TOO_FEW_SAMPLES);
static_assert(-42400 - int32_t(status::kBadModes) == QDM_ERR_MODE_VALUES);

using plain::Finite;
using plain::PublicCode;

struct Outputs {
  double* amplitude_se;
  double* phase_se;
  double* damping_se;
  double* frequency_se;
  double* noise_variance;
};

void Clear(const Outputs& o, int32_t modes) {
  const size_t bytes = static_cast<size_t>(modes) * sizeof(double);
  std::memset(o.amplitude_se, 0, bytes);
  std::memset(o.phase_se, 0, bytes);
  std::memset(o.damping_se, 0, bytes);
  std::memset(o.frequency_se, 0, bytes);
  *o.noise_variance = 0.0;
}

// Results scaled back, and screened: an infinity anywhere, or a NaN outside
// the modes the warning names (all four errors of a mode NaN together), is a
// non-finite result.
bool Screen(const Outputs& o, int32_t modes, int scale, bool warned) {
  *o.noise_variance = std::ldexp(*o.noise_variance, -2 * scale);
  bool good = Finite(*o.noise_variance);
  for (int32_t i = 0; i < modes; ++i) {
    o.amplitude_se[i] = std::ldexp(o.amplitude_se[i], -scale);
    const double v[4] = {o.amplitude_se[i], o.phase_se[i], o.damping_se[i], o.frequency_se[i]};
    const bool allNan =
        std::isnan(v[0]) && std::isnan(v[1]) && std::isnan(v[2]) && std::isnan(v[3]);
    if (allNan && warned) continue;
    for (double e : v) good = good && Finite(e);
  }
  return good;
}

template <typename T>
int32_t Run(const T* x, int32_t n, double fs, bool pairs, const double* amplitude,
            const double* phase, const double* damping, const double* frequency, int32_t modes,
            const Outputs& o) {
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check = checks::ModeErrors(n, modes, fs, last_error::Begin());
  if (check != status::kOk) return last_error::End(PublicCode(check));
  const std::pair<const void*, const char*> required[] = {{x, "x"},
                                                          {amplitude, "amplitude"},
                                                          {phase, "phase"},
                                                          {damping, "damping"},
                                                          {frequency, "frequency"},
                                                          {o.amplitude_se, "amplitude_se"},
                                                          {o.phase_se, "phase_se"},
                                                          {o.damping_se, "damping_se"},
                                                          {o.frequency_se, "frequency_se"},
                                                          {o.noise_variance, "noise_variance"}};
  for (const auto& [pointer, name] : required) {
    if (pointer == nullptr) return last_error::Null(name);
  }
  if (ModeErrorsWork(modes) > static_cast<double>(QDM_MAX_WORK_BYTES)) {
    return last_error::WorkLimit(ModeErrorsWork(modes), n);
  }
  if (!Finite(fs)) return last_error::NotFinite("fs", fs);
  if (plain::Admitting()) return last_error::End(QDM_OK);
  const size_t values = static_cast<size_t>(n) * (cx ? 2 : 1);
  const double extent = plain::Extent(reinterpret_cast<const double*>(x), int64_t(values));
  if (extent < 0.0)
    return last_error::NotFiniteSample(reinterpret_cast<const double*>(x), int64_t(values), cx);

  ModeSet set{amplitude, phase, damping, frequency, modes, fs};
  int64_t parameters = 0;
  const StatusCode plan = ModeErrorsPlan(n, cx, pairs, set, &parameters);
  if (plan != status::kOk) return last_error::End(PublicCode(plan));

  // One scale for the record and the amplitudes: the model is linear in both.
  const double largest = std::fmax(extent, plain::Extent(amplitude, modes));
  const int scale = plain::RecordScale(largest);
  WorkArray<double> copy;
  WorkArray<double> amps;
  const T* xs = x;
  StatusCode s = status::kOk;
  if (scale != 0) {
    copy = plain::ScaledCopy(reinterpret_cast<const double*>(x), values, scale);
    amps = plain::ScaledCopy(amplitude, static_cast<size_t>(modes), scale);
    if (!copy || !amps) {
      s = status::kNoMemory;
    } else {
      xs = reinterpret_cast<const T*>(copy.get());
      set.amplitude = amps.get();
    }
  }
  if (s == status::kOk) {
    const ModeStdErrors out{o.amplitude_se, o.phase_se, o.damping_se, o.frequency_se,
                            o.noise_variance};
    if constexpr (cx) {
      s = ModeErrorsComplex(xs, n, set, out);
    } else {
      s = ModeErrorsReal(xs, n, pairs, set, out);
    }
  }
  if (s >= 0 && !Screen(o, modes, scale, s == status::kBoundSingular)) {
    s = static_cast<StatusCode>(QDM_ERR_NON_FINITE_RESULT);
  }
  if (s < 0) Clear(o, modes);
  return last_error::End(PublicCode(s));
}

}  // namespace

QDM_PLAIN_API int32_t qdm_mode_errors_real(const double* x, int32_t n, double fs,
                                           int32_t real_signal, int32_t modes,
                                           const double* amplitude, const double* phase,
                                           const double* damping, const double* frequency,
                                           double* amplitude_se, double* phase_se,
                                           double* damping_se, double* frequency_se,
                                           double* noise_variance) {
  return Run(x, n, fs, real_signal == 0, amplitude, phase, damping, frequency, modes,
             {amplitude_se, phase_se, damping_se, frequency_se, noise_variance});
}

QDM_PLAIN_API int32_t qdm_mode_errors_complex(const qdm_complex* x, int32_t n, double fs,
                                              int32_t modes, const double* amplitude,
                                              const double* phase, const double* damping,
                                              const double* frequency, double* amplitude_se,
                                              double* phase_se, double* damping_se,
                                              double* frequency_se, double* noise_variance) {
  return Run(reinterpret_cast<const Complex*>(x), n, fs, false, amplitude, phase, damping,
             frequency, modes, {amplitude_se, phase_se, damping_se, frequency_se, noise_variance});
}
