// The plain C API: the fourteen fits over ordinary caller arrays. Each function
// is one table of what its call needs (checks, pointers, work size, outputs)
// and one estimator call; RunPlain does the rest:
//
//   1. the argument checks shared with the host face (estimation/entry_checks.h);
//      a failed check returns its code and writes nothing;
//   2. required pointers present, else QDM_ERR_NULL_POINTER;
//   3. the estimated work memory within QDM_MAX_WORK_BYTES, else QDM_ERR_WORK_LIMIT;
//   4. every sample (and the sampling rate) finite, else QDM_ERR_NON_FINITE;
//   5. the estimator, on the caller's arrays (they need only double alignment,
//      which is also the estimators' requirement), inside a call record;
//   6. a failure the estimator absorbed, noted in the record, replaces success;
//      on any error the outputs are zero-filled and the counts and out doubles
//      set to 0.
#include <cmath>
#include <cstring>
#include <initializer_list>
#include <type_traits>

#include "core/call_record.h"
#include "core/types.h"
#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "qdm_api.h"

namespace {

// ---- one table of codes: the public numbering is the internal one mapped as
// the host maps it ------------------------------------------------------------------
constexpr int32_t PublicCode(StatusCode s) {
  return s == status::kRankDeficient ? s : (s > 0 ? -42400 - s : s);
}
static_assert(PublicCode(status::kEmptyInput) == QDM_ERR_EMPTY_INPUT);
static_assert(PublicCode(status::kBadOrder) == QDM_ERR_ORDER);
static_assert(PublicCode(status::kBadCount) == QDM_ERR_COUNT);
static_assert(PublicCode(status::kCountAboveOrder) == QDM_ERR_COUNT_ABOVE_ORDER);
static_assert(PublicCode(status::kBadMinOrder) == QDM_ERR_MIN_ORDER);
static_assert(PublicCode(status::kBadMdlUpper) == QDM_ERR_MDL_UPPER);
static_assert(PublicCode(status::kNoModes) == QDM_ERR_NO_MODES);
static_assert(PublicCode(status::kBadSpectrumSize) == QDM_ERR_SPECTRUM_SIZE);
static_assert(PublicCode(status::kBadSampleRate) == QDM_ERR_SAMPLE_RATE);
static_assert(PublicCode(status::kRankDeficient) == QDM_WARN_RANK_DEFICIENT);
static_assert(status::kNoMemory == QDM_ERR_NO_MEMORY && status::kBadSize == QDM_ERR_BAD_SIZE &&
              status::kNegativeDim == QDM_ERR_NEGATIVE_DIM &&
              status::kBadOption == QDM_ERR_OPTION &&
              status::kNoConvergence == QDM_ERR_NO_CONVERGENCE &&
              status::kBadPolynomial == QDM_ERR_POLYNOMIAL &&
              status::kNonFinite == QDM_ERR_EXTREME_VALUE && status::kRootNaN == QDM_ERR_ROOT_NAN &&
              status::kIllegalArgument == QDM_ERR_ILLEGAL_ARGUMENT &&
              status::kFftLengthMismatch == QDM_ERR_FFT_LENGTH);

// ---- what one call hands to RunPlain ---------------------------------------------

struct Samples {
  const void* data;
  int32_t n;
  bool complex;
};

struct OutArray {
  void* data;
  size_t bytes;
};

struct PlainCall {
  StatusCode check;                         // the shared argument checks' verdict
  Samples x;
  std::initializer_list<const void*> required;  // pointers the call dereferences
  double work_bytes;                        // estimated work memory
  const double* rate;                       // sampling rate, or null
  std::initializer_list<OutArray> outputs;  // zero-filled on failure
  std::initializer_list<double*> doubles;   // 0.0 on failure
  int32_t* count;                           // 0 on failure, or null
};

bool AllFinite(const Samples& x) {
  const double* v = static_cast<const double*>(x.data);
  const int64_t values = int64_t{x.n} * (x.complex ? 2 : 1);
  for (int64_t i = 0; i < values; ++i) {
    if (!std::isfinite(v[i])) return false;
  }
  return true;
}

template <typename Fit>
int32_t RunPlain(const PlainCall& call, const Fit& fit) {
  if (call.check != status::kOk) return PublicCode(call.check);
  if (call.x.data == nullptr) return QDM_ERR_NULL_POINTER;
  for (const void* p : call.required) {
    if (p == nullptr) return QDM_ERR_NULL_POINTER;
  }
  if (call.work_bytes > static_cast<double>(QDM_MAX_WORK_BYTES)) return QDM_ERR_WORK_LIMIT;
  if (!AllFinite(call.x) || (call.rate != nullptr && !std::isfinite(*call.rate))) {
    return QDM_ERR_NON_FINITE;
  }

  call_record::Begin();
  StatusCode s = fit();
  const StatusCode absorbed = call_record::End();
  if (s == status::kOk || s == status::kRankDeficient) s = MergeStatus(s, absorbed);
  if (s < 0) {
    for (const OutArray& out : call.outputs) std::memset(out.data, 0, out.bytes);
    for (double* d : call.doubles) *d = 0.0;
    if (call.count != nullptr) *call.count = 0;
  }
  return PublicCode(s);
}

// ---- sizes ------------------------------------------------------------------------

size_t Bytes(int64_t count, size_t element) { return static_cast<size_t>(count) * element; }
constexpr size_t kReal = sizeof(double);
constexpr size_t kCx = 2 * sizeof(double);

// Work memory estimates, from the largest matrices each method holds at once
// (with the copies LAPACK works on) plus a few vectors per sample. They are
// only compared with the bound, so a generous constant factor is fine.
double LinearPredictionWork(int32_t n, int32_t p, size_t element, int copies) {
  return static_cast<double>(element) * (copies * double(n - p) * p + 8.0 * n + 8.0 * p);
}
double ModeFitWork(int32_t n, int32_t k) { return kCx * (3.0 * n * k + 8.0 * n); }
double PencilWork(int32_t n, int32_t L, size_t element) {
  return static_cast<double>(element) * (8.0 * double(n - L) * L + 8.0 * n);
}
double SpectrumWork(int32_t length) { return 48.0 * length; }

const Complex* AsComplex(const qdm_complex* x) { return reinterpret_cast<const Complex*>(x); }
Complex* AsComplex(qdm_complex* x) { return reinterpret_cast<Complex*>(x); }

// ---- shared bodies of the twins ----------------------------------------------------

template <typename T>
int32_t Covariance(const T* x, int32_t n, int32_t p, T* a, qdm_complex* poles,
                   double* variance) {
  constexpr bool cx = std::is_same_v<T, Complex>;
  const StatusCode check = checks::Covariance(n, p);
  const size_t e = cx ? kCx : kReal;
  const int32_t q = check == status::kOk ? p : 0;
  return RunPlain(
      {check, {x, n, cx}, {a, poles, variance}, LinearPredictionWork(n, q, e, 4), nullptr,
       {{a, Bytes(q + int64_t{1}, e)}, {poles, Bytes(q, kCx)}}, {variance}, nullptr},
      [&] {
        if constexpr (cx) {
          return CovarianceArComplex(x, n, p, a, AsComplex(poles), variance);
        } else {
          return CovarianceArReal(x, n, p, a, AsComplex(poles), variance);
        }
      });
}

template <typename T>
int32_t Pcar(const T* x, int32_t n, int32_t order, int32_t components, T* a, qdm_complex* roots) {
  constexpr bool cx = std::is_same_v<T, Complex>;
  const StatusCode check = checks::Pcar(n, order, components);
  const size_t e = cx ? kCx : kReal;
  const int32_t p = check == status::kOk ? order : 0;
  return RunPlain({check, {x, n, cx}, {a, roots}, LinearPredictionWork(n, p, e, 8), nullptr,
                   {{a, Bytes(p + int64_t{1}, e)}, {roots, Bytes(p, kCx)}}, {}, nullptr},
                  [&] {
                    if constexpr (cx) {
                      return PcarEstimateComplex(x, n, p, components, a, AsComplex(roots));
                    } else {
                      return PcarEstimateReal(x, n, p, components, a, AsComplex(roots));
                    }
                  });
}

// On an error after the checks the order is 0, as on the host face.
template <typename T>
int32_t Mdl(const T* x, int32_t n, int32_t max_order, int32_t min_order, int32_t* order) {
  constexpr bool cx = std::is_same_v<T, Complex>;
  const StatusCode check = checks::Mdl(n, max_order, min_order);
  const int32_t L = check == status::kOk ? max_order : 0;
  return RunPlain({check, {x, n, cx}, {order}, PencilWork(n, L, cx ? kCx : kReal) + ModeFitWork(n, L),
                   nullptr, {}, {}, order},
                  [&] {
                    if constexpr (cx) {
                      return MdlOrderComplex(x, n, L, min_order, order);
                    } else {
                      return MdlOrderReal(x, n, L, min_order, order);
                    }
                  });
}

}  // namespace

// ================================ the API ================================

extern "C" {

QDM_PLAIN_API const char* qdm_version(void) { return QDM_VERSION_STRING; }

QDM_PLAIN_API const char* qdm_status_text(int32_t code) {
#define QDM_STATUS_TEXT_CASE(name, value, text) \
  case value:                                  \
    return text;
  switch (code) { QDM_STATUS_TABLE(QDM_STATUS_TEXT_CASE) }
#undef QDM_STATUS_TEXT_CASE
  if (code < -42400) {
    return "the host's NumericArrayResize failed: its own error is -42400 minus this status";
  }
  return "unknown status";
}

QDM_PLAIN_API int32_t qdm_spectrum_length(int32_t points) {
  return points < 2 ? 0 : SpectrumLength(points);
}

// ---- covariance AR ----------------------------------------------------------------

QDM_PLAIN_API int32_t qdm_covariance_real(const double* x, int32_t n, int32_t order,
                                          double* coefficients, qdm_complex* poles,
                                          double* noise_variance) {
  return Covariance(x, n, order, coefficients, poles, noise_variance);
}

QDM_PLAIN_API int32_t qdm_covariance_complex(const qdm_complex* x, int32_t n, int32_t order,
                                             qdm_complex* coefficients, qdm_complex* poles,
                                             double* noise_variance) {
  return Covariance(AsComplex(x), n, order, AsComplex(coefficients), poles, noise_variance);
}

// ---- principal-component AR -----------------------------------------------------------

QDM_PLAIN_API int32_t qdm_pcar_real(const double* x, int32_t n, int32_t order,
                                    int32_t components, double* coefficients,
                                    qdm_complex* roots) {
  return Pcar(x, n, order, components, coefficients, roots);
}

QDM_PLAIN_API int32_t qdm_pcar_complex(const qdm_complex* x, int32_t n, int32_t order,
                                       int32_t components, qdm_complex* coefficients,
                                       qdm_complex* roots) {
  return Pcar(AsComplex(x), n, order, components, AsComplex(coefficients), roots);
}

// ---- Prony --------------------------------------------------------------------------------

QDM_PLAIN_API int32_t qdm_prony_real(const double* x, int32_t n, int32_t order, double fs,
                                     int32_t real_signal, double* amplitude, double* phase,
                                     double* damping, double* frequency, int32_t* modes) {
  const StatusCode check = checks::Prony(n, order, fs);
  const int32_t p = check == status::kOk ? order : 0;
  return RunPlain({check, {x, n, false}, {amplitude, phase, damping, frequency, modes},
                   LinearPredictionWork(n, p, kReal, 4) + ModeFitWork(n, p), &fs,
                   {{amplitude, Bytes(p, kReal)}, {phase, Bytes(p, kReal)},
                    {damping, Bytes(p, kReal)}, {frequency, Bytes(p, kReal)}},
                   {}, modes},
                  [&] {
                    return PronyReal(x, n, p, fs, real_signal, amplitude, phase, damping,
                                     frequency, modes);
                  });
}

QDM_PLAIN_API int32_t qdm_prony_complex(const qdm_complex* x, int32_t n, int32_t order,
                                        double fs, double* amplitude, double* phase,
                                        double* damping, double* frequency, int32_t* modes) {
  const StatusCode check = checks::Prony(n, order, fs);
  const int32_t p = check == status::kOk ? order : 0;
  return RunPlain({check, {x, n, true}, {amplitude, phase, damping, frequency, modes},
                   LinearPredictionWork(n, p, kCx, 4) + ModeFitWork(n, p), &fs,
                   {{amplitude, Bytes(p, kReal)}, {phase, Bytes(p, kReal)},
                    {damping, Bytes(p, kReal)}, {frequency, Bytes(p, kReal)}},
                   {}, modes},
                  [&] {
                    return PronyComplex(AsComplex(x), n, p, fs, amplitude, phase, damping,
                                        frequency, modes);
                  });
}

// ---- matrix pencil ----------------------------------------------------------------------

QDM_PLAIN_API int32_t qdm_matrix_pencil_real(const double* x, int32_t n, int32_t pencil,
                                             int32_t order, double fs, int32_t real_signal,
                                             double* amplitude, double* phase, double* damping,
                                             double* frequency, int32_t* modes, double* mse) {
  const StatusCode check = checks::Pencil(n, pencil, order, fs);
  const int32_t M = check == status::kOk ? order : 0;
  const int32_t L = check == status::kOk ? pencil : 0;
  return RunPlain({check, {x, n, false}, {amplitude, phase, damping, frequency, modes, mse},
                   PencilWork(n, L, kReal) + ModeFitWork(n, M), &fs,
                   {{amplitude, Bytes(M, kReal)}, {phase, Bytes(M, kReal)},
                    {damping, Bytes(M, kReal)}, {frequency, Bytes(M, kReal)}},
                   {mse}, modes},
                  [&] {
                    return MatrixPencilReal(x, n, L, M, fs, real_signal, amplitude, phase,
                                            damping, frequency, mse, modes);
                  });
}

QDM_PLAIN_API int32_t qdm_matrix_pencil_complex(const qdm_complex* x, int32_t n, int32_t pencil,
                                                int32_t order, double fs, double* amplitude,
                                                double* phase, double* damping,
                                                double* frequency, int32_t* modes, double* mse) {
  const StatusCode check = checks::Pencil(n, pencil, order, fs);
  const int32_t M = check == status::kOk ? order : 0;
  const int32_t L = check == status::kOk ? pencil : 0;
  return RunPlain({check, {x, n, true}, {amplitude, phase, damping, frequency, modes, mse},
                   PencilWork(n, L, kCx) + ModeFitWork(n, M), &fs,
                   {{amplitude, Bytes(M, kReal)}, {phase, Bytes(M, kReal)},
                    {damping, Bytes(M, kReal)}, {frequency, Bytes(M, kReal)}},
                   {mse}, modes},
                  [&] {
                    return MatrixPencilComplex(AsComplex(x), n, L, M, fs, amplitude, phase,
                                               damping, frequency, mse, modes);
                  });
}

// ---- MDL ----------------------------------------------------------------------------------

QDM_PLAIN_API int32_t qdm_mdl_order_real(const double* x, int32_t n, int32_t max_order,
                                         int32_t min_order, int32_t* order) {
  return Mdl(x, n, max_order, min_order, order);
}

QDM_PLAIN_API int32_t qdm_mdl_order_complex(const qdm_complex* x, int32_t n, int32_t max_order,
                                            int32_t min_order, int32_t* order) {
  return Mdl(AsComplex(x), n, max_order, min_order, order);
}

// ---- spectra ------------------------------------------------------------------------------

QDM_PLAIN_API int32_t qdm_covariance_psd_real(const double* x, int32_t n, int32_t order,
                                              int32_t points, double fs, double* spectrum,
                                              double* f0, double* df, double* noise_variance) {
  const StatusCode check = checks::CovSpectrum(n, order, points, fs);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain({check, {x, n, false}, {spectrum, f0, df, noise_variance},
                   LinearPredictionWork(n, p, kReal, 4) + SpectrumWork(N), &fs,
                   {{spectrum, Bytes(N, kReal)}}, {f0, df, noise_variance}, nullptr},
                  [&] {
                    const StatusCode s =
                        CovPowerSpectrumReal(x, n, p, N, fs, &result, noise_variance);
                    *f0 = result.f0;
                    *df = result.df;
                    return s;
                  });
}

QDM_PLAIN_API int32_t qdm_covariance_psd_complex(const qdm_complex* x, int32_t n,
                                                 int32_t order, int32_t points, double fs,
                                                 double* spectrum, double* f0, double* df,
                                                 double* noise_variance) {
  const StatusCode check = checks::CovSpectrum(n, order, points, fs);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain({check, {x, n, true}, {spectrum, f0, df, noise_variance},
                   LinearPredictionWork(n, p, kCx, 4) + SpectrumWork(N), &fs,
                   {{spectrum, Bytes(N, kReal)}}, {f0, df, noise_variance}, nullptr},
                  [&] {
                    const StatusCode s = CovPowerSpectrumComplex(AsComplex(x), n, p, N, fs,
                                                                 &result, noise_variance);
                    *f0 = result.f0;
                    *df = result.df;
                    return s;
                  });
}

QDM_PLAIN_API int32_t qdm_pcar_psd_real(const double* x, int32_t n, int32_t order,
                                        int32_t points, int32_t components, double fs,
                                        int32_t real_signal, double* amplitude, double* phase,
                                        double* frequency, int32_t* modes, double* spectrum,
                                        double* f0, double* df, double* fit_error) {
  const StatusCode check = checks::PcarSpectrum(n, order, components, points, fs);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  const int32_t k = check == status::kOk ? components : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain(
      {check, {x, n, false}, {amplitude, phase, frequency, modes, spectrum, f0, df, fit_error},
       LinearPredictionWork(n, p, kReal, 8) + ModeFitWork(n, k) + SpectrumWork(N), &fs,
       {{amplitude, Bytes(k, kReal)}, {phase, Bytes(k, kReal)}, {frequency, Bytes(k, kReal)},
        {spectrum, Bytes(N, kReal)}},
       {f0, df, fit_error}, modes},
      [&] {
        const StatusCode s = PcarPowerSpectrumReal(x, n, p, k, N, fs, real_signal, amplitude,
                                                   phase, frequency, fit_error, &result, modes);
        *f0 = result.f0;
        *df = result.df;
        return s;
      });
}

QDM_PLAIN_API int32_t qdm_pcar_psd_complex(const qdm_complex* x, int32_t n, int32_t order,
                                           int32_t points, int32_t components, double fs,
                                           double* amplitude, double* phase, double* frequency,
                                           int32_t* modes, double* spectrum, double* f0,
                                           double* df, double* fit_error) {
  const StatusCode check = checks::PcarSpectrum(n, order, components, points, fs);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  const int32_t k = check == status::kOk ? components : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain(
      {check, {x, n, true}, {amplitude, phase, frequency, modes, spectrum, f0, df, fit_error},
       LinearPredictionWork(n, p, kCx, 8) + ModeFitWork(n, k) + SpectrumWork(N), &fs,
       {{amplitude, Bytes(k, kReal)}, {phase, Bytes(k, kReal)}, {frequency, Bytes(k, kReal)},
        {spectrum, Bytes(N, kReal)}},
       {f0, df, fit_error}, modes},
      [&] {
        const StatusCode s =
            PcarPowerSpectrumComplex(AsComplex(x), n, p, k, N, fs, amplitude, phase, frequency,
                                     fit_error, &result, modes);
        *f0 = result.f0;
        *df = result.df;
        return s;
      });
}

}  // extern "C"
