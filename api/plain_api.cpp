// The plain C API: the fourteen fits over ordinary caller arrays. Each function
// is one table of what its call needs (checks, pointers, work size, outputs)
// and one estimator call; RunPlain does the rest:
//
//   1. the argument checks shared with the host face (estimation/entry_checks.h),
//      with the order bound floor(2n/3) taken in 64 bits, then this face's own
//      (a spectrum shorter than the AR polynomial); a failed check returns its
//      code and writes nothing;
//   2. required pointers present, else QDM_ERR_NULL_POINTER;
//   3. the estimated work memory within QDM_MAX_WORK_BYTES, else QDM_ERR_WORK_LIMIT;
//   4. every sample (and the sampling rate) finite, else QDM_ERR_NON_FINITE;
//   5. the estimator, on the caller's arrays (they need only double alignment,
//      which is also the estimators' requirement), inside a call record; a
//      record whose largest magnitude lies outside [2^-128, 2^128] is fitted as
//      a copy scaled by a power of two and the results are scaled back;
//   6. a failure the estimator absorbed, noted in the record, replaces success;
//   7. every number about to be handed back finite, else
//      QDM_ERR_NON_FINITE_RESULT; on any error the outputs are zero-filled and
//      the counts and out doubles set to 0.
#include <algorithm>
#include <cfloat>
#include <cmath>
#include <cstring>
#include <initializer_list>
#include <type_traits>

#include "core/call_record.h"
#include "core/types.h"
#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "numeric/work.h"
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

// This face's own codes: a spectrum shorter than the AR polynomial (the host
// face wraps the coefficients there and so evaluates another polynomial), a
// solver route it does not know, and a fit that ran but has a NaN or an
// infinity among its results.
constexpr StatusCode kSpectrumTooShort{22};
constexpr StatusCode kBadSolver{23};
constexpr auto kNonFiniteResult = static_cast<StatusCode>(QDM_ERR_NON_FINITE_RESULT);
static_assert(PublicCode(kSpectrumTooShort) == QDM_ERR_SPECTRUM_TOO_SHORT);
static_assert(PublicCode(kBadSolver) == QDM_ERR_SOLVER);
static_assert(int32_t(status::kKrylovNoConvergence) == QDM_ERR_KRYLOV_NO_CONVERGENCE);
static_assert(int32_t(PencilSolver::kAuto) == QDM_SOLVER_AUTO &&
              int32_t(PencilSolver::kDense) == QDM_SOLVER_DENSE &&
              int32_t(PencilSolver::kKrylov) == QDM_SOLVER_KRYLOV);
static_assert(PublicCode(kNonFiniteResult) == QDM_ERR_NON_FINITE_RESULT);

// Every order check of this face takes floor(2n/3) in 64 bits: for n >= 2^30
// the host's 32-bit bound is negative and would refuse every order, where the
// work-memory bound is the right refusal.
constexpr checks::Bound kWide = checks::Bound::kWide;
static_assert(int32_t(status::kNoMemory) == QDM_ERR_NO_MEMORY &&
              int32_t(status::kBadSize) == QDM_ERR_BAD_SIZE &&
              int32_t(status::kNegativeDim) == QDM_ERR_NEGATIVE_DIM &&
              int32_t(status::kBadOption) == QDM_ERR_OPTION &&
              int32_t(status::kNoConvergence) == QDM_ERR_NO_CONVERGENCE &&
              int32_t(status::kBadPolynomial) == QDM_ERR_POLYNOMIAL &&
              int32_t(status::kNonFinite) == QDM_ERR_EXTREME_VALUE &&
              int32_t(status::kRootNaN) == QDM_ERR_ROOT_NAN &&
              int32_t(status::kIllegalArgument) == QDM_ERR_ILLEGAL_ARGUMENT &&
              int32_t(status::kFftLengthMismatch) == QDM_ERR_FFT_LENGTH);

// ---- what one call hands to RunPlain ---------------------------------------------

struct Samples {
  const void* data;
  int32_t n;
  bool complex;
};

// An output array, and how its values follow a power-of-two scaling of the
// record: 0 unchanged (coefficients, poles, phases, frequencies, spectra), 1
// as the record (amplitudes), 2 as its square (variances, errors). A counted
// array holds results in its first *count values only.
struct OutArray {
  void* data;
  size_t bytes;
  int power = 0;
  bool counted = false;
};

struct OutDouble {
  double* value;
  int power = 0;
};

struct PlainCall {
  StatusCode check;  // the argument checks' verdict
  Samples x;
  std::initializer_list<const void*> required;  // pointers the call dereferences
  double work_bytes;                            // estimated work memory
  const double* rate;                           // sampling rate, or null
  std::initializer_list<OutArray> outputs;      // zero-filled on failure
  std::initializer_list<OutDouble> doubles;     // 0.0 on failure
  int32_t* count;                               // 0 on failure, or null
};

// Folds one sample into a running largest magnitude; a NaN or an infinity
// makes it infinite for good.
inline void FoldMagnitude(double v, double& largest) {
  const double a = std::fabs(v);
  largest = a > largest ? a : largest;
  if (!(a <= DBL_MAX)) largest = HUGE_VAL;
}

// The largest magnitude among the samples, or -1 when one is NaN or infinite.
// Four independent lanes and no early exit keep the scan about as fast as a
// plain finiteness test.
double Extent(const Samples& x) {
  const double* v = static_cast<const double*>(x.data);
  const int64_t values = int64_t{x.n} * (x.complex ? 2 : 1);
  double m0 = 0.0, m1 = 0.0, m2 = 0.0, m3 = 0.0;
  int64_t i = 0;
  for (; i + 4 <= values; i += 4) {
    FoldMagnitude(v[i], m0);
    FoldMagnitude(v[i + 1], m1);
    FoldMagnitude(v[i + 2], m2);
    FoldMagnitude(v[i + 3], m3);
  }
  for (; i < values; ++i) FoldMagnitude(v[i], m0);
  const double largest = std::max(std::max(m0, m1), std::max(m2, m3));
  return largest > DBL_MAX ? -1.0 : largest;
}

// The power of two a record is multiplied by before the fit: 0 inside
// [2^-128, 2^128], where the fits' squares and sums cannot overflow or lose
// bits to underflow and the estimators see the caller's samples unchanged;
// outside it, the exponent that brings the largest magnitude into [1, 2).
// Multiplying by a power of two is exact (but for samples that fall below
// 2^-1022 beside a much larger maximum, far under its rounding), every fit is
// homogeneous in the record, and the results are scaled back exactly.
int RecordScale(double largest) {
  constexpr double kHigh = 0x1p128, kLow = 0x1p-128;
  if (largest == 0.0 || (largest >= kLow && largest <= kHigh)) return 0;
  return -std::ilogb(largest);
}

// Values of an output that hold results after the fit.
size_t ResultValues(const OutArray& out, const int32_t* count) {
  const size_t all = out.bytes / sizeof(double);
  if (!out.counted) return all;
  return count == nullptr || *count < 0 ? 0 : std::min(all, static_cast<size_t>(*count));
}

// Undoes the record's scaling on every result (exact unless a value leaves the
// double range, which the screen then reports) and screens every result for
// NaN and infinity.
bool ResultsFinite(const PlainCall& call, int scale) {
  int bad = 0;
  for (const OutArray& out : call.outputs) {
    double* v = static_cast<double*>(out.data);
    const size_t values = ResultValues(out, call.count);
    if (scale != 0 && out.power != 0) {
      for (size_t i = 0; i < values; ++i) v[i] = std::ldexp(v[i], -scale * out.power);
    }
    for (size_t i = 0; i < values; ++i) bad |= !(std::fabs(v[i]) <= DBL_MAX);
  }
  for (const OutDouble& d : call.doubles) {
    if (scale != 0 && d.power != 0) *d.value = std::ldexp(*d.value, -scale * d.power);
    bad |= !(std::fabs(*d.value) <= DBL_MAX);
  }
  return bad == 0;
}

// The estimator call: `fit` receives the samples to fit, the caller's or a
// scaled copy of them.
template <typename Fit>
int32_t RunPlain(const PlainCall& call, const Fit& fit) {
  if (call.check != status::kOk) return PublicCode(call.check);
  if (call.x.data == nullptr) return QDM_ERR_NULL_POINTER;
  for (const void* p : call.required) {
    if (p == nullptr) return QDM_ERR_NULL_POINTER;
  }
  if (call.work_bytes > static_cast<double>(QDM_MAX_WORK_BYTES)) return QDM_ERR_WORK_LIMIT;
  const double largest = Extent(call.x);
  if (largest < 0.0 || (call.rate != nullptr && !std::isfinite(*call.rate))) {
    return QDM_ERR_NON_FINITE;
  }

  const int scale = RecordScale(largest);
  StatusCode s = status::kOk;
  WorkArray<double> scaled;
  const void* samples = call.x.data;
  if (scale != 0) {
    const size_t values = static_cast<size_t>(call.x.n) * (call.x.complex ? 2 : 1);
    scaled = AllocWorkUninit<double>(values);
    if (!scaled) s = status::kNoMemory;
    const double* v = static_cast<const double*>(call.x.data);
    for (size_t i = 0; scaled && i < values; ++i) scaled[i] = std::ldexp(v[i], scale);
    samples = scaled.get();
  }
  if (s == status::kOk) {
    call_record::Begin();
    s = fit(samples);
    const StatusCode absorbed = call_record::End();
    if (s == status::kOk || s == status::kRankDeficient) s = MergeStatus(s, absorbed);
  }
  scaled.reset();
  if (s >= 0 && !ResultsFinite(call, scale)) s = kNonFiniteResult;
  if (s < 0) {
    for (const OutArray& out : call.outputs) std::memset(out.data, 0, out.bytes);
    for (const OutDouble& d : call.doubles) *d.value = 0.0;
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
// The Krylov route holds two Lanczos bases of at most max(2M + 8, M + 16)
// vectors (n values between them), the FFT buffers and the M triplets (n
// values each between left and right).
double PencilKrylovWork(int32_t n, int32_t M, size_t element) {
  const double k = std::max(2.0 * M + 8.0, M + 16.0);
  return static_cast<double>(element) * (k + 1.0 + M) * n + kCx * 6.0 * n;
}
// PCAR's Krylov route: two Lanczos bases of at most max(2k + 10, k + 17)
// vectors and the k + 1 triplets over the 2(n - p) + p sides of the
// forward-backward matrix, the FFT buffers, and the fit's vectors.
double PcarKrylovWork(int32_t n, int32_t p, int32_t k, size_t element) {
  const double m = std::max(2.0 * k + 10.0, k + 17.0);
  const double sides = 2.0 * double(n - p) + p;
  return static_cast<double>(element) * ((m + k + 2.0) * sides + 8.0 * n) + kCx * 6.0 * n;
}
double SpectrumWork(int32_t length) { return 48.0 * length; }

const Complex* AsComplex(const qdm_complex* x) { return reinterpret_cast<const Complex*>(x); }
Complex* AsComplex(qdm_complex* x) { return reinterpret_cast<Complex*>(x); }

// ---- shared bodies of the twins ----------------------------------------------------

template <typename T>
const T* As(const void* samples) {
  return static_cast<const T*>(samples);
}

template <typename T>
int32_t Covariance(const T* x, int32_t n, int32_t p, T* a, qdm_complex* poles, double* variance) {
  constexpr bool cx = std::is_same_v<T, Complex>;
  const StatusCode check = checks::Covariance(n, p, kWide);
  const size_t e = cx ? kCx : kReal;
  const int32_t q = check == status::kOk ? p : 0;
  return RunPlain({check,
                   {x, n, cx},
                   {a, poles, variance},
                   LinearPredictionWork(n, q, e, 4),
                   nullptr,
                   {{a, Bytes(q + int64_t{1}, e)}, {poles, Bytes(q, kCx)}},
                   {{variance, 2}},
                   nullptr},
                  [&](const void* xs) {
                    if constexpr (cx) {
                      return CovarianceArComplex(As<T>(xs), n, p, a, AsComplex(poles), variance);
                    } else {
                      return CovarianceArReal(As<T>(xs), n, p, a, AsComplex(poles), variance);
                    }
                  });
}

// PCAR on either route; the automatic choice also sets the work estimate.
template <typename T>
int32_t Pcar(const T* x, int32_t n, int32_t order, int32_t components, int32_t solver, T* a,
             qdm_complex* roots) {
  constexpr bool cx = std::is_same_v<T, Complex>;
  StatusCode check = checks::Pcar(n, order, components, kWide);
  if (check == status::kOk && (solver < QDM_SOLVER_AUTO || solver > QDM_SOLVER_KRYLOV)) {
    check = kBadSolver;
  }
  const size_t e = cx ? kCx : kReal;
  const int32_t p = check == status::kOk ? order : 0;
  const int32_t k = check == status::kOk ? components : 0;
  PcarSolver route = static_cast<PcarSolver>(check == status::kOk ? solver : 0);
  if (route == PcarSolver::kAuto) {
    route = PcarPrefersKrylov(n, p, k, cx) ? PcarSolver::kKrylov : PcarSolver::kDense;
  }
  const double work =
      route == PcarSolver::kKrylov ? PcarKrylovWork(n, p, k, e) : LinearPredictionWork(n, p, e, 8);
  return RunPlain({check,
                   {x, n, cx},
                   {a, roots},
                   work,
                   nullptr,
                   {{a, Bytes(p + int64_t{1}, e)}, {roots, Bytes(p, kCx)}},
                   {},
                   nullptr},
                  [&](const void* xs) {
                    if constexpr (cx) {
                      return PcarSolverComplex(As<T>(xs), n, p, k, route, a, AsComplex(roots));
                    } else {
                      return PcarSolverReal(As<T>(xs), n, p, k, route, a, AsComplex(roots));
                    }
                  });
}

// On an error after the checks the order is 0, as on the host face.
template <typename T>
int32_t Mdl(const T* x, int32_t n, int32_t max_order, int32_t min_order, int32_t* order) {
  constexpr bool cx = std::is_same_v<T, Complex>;
  const StatusCode check = checks::Mdl(n, max_order, min_order, kWide);
  const int32_t L = check == status::kOk ? max_order : 0;
  return RunPlain({check,
                   {x, n, cx},
                   {order},
                   PencilWork(n, L, cx ? kCx : kReal) + ModeFitWork(n, L),
                   nullptr,
                   {},
                   {},
                   order},
                  [&](const void* xs) {
                    if constexpr (cx) {
                      return MdlOrderComplex(As<T>(xs), n, L, min_order, order);
                    } else {
                      return MdlOrderReal(As<T>(xs), n, L, min_order, order);
                    }
                  });
}

// The mode arrays of Prony and the pencil: m values each, counted by *modes.
#define QDM_MODE_OUTPUTS(m)                                                 \
  {amplitude, Bytes(m, kReal), 1, true}, {phase, Bytes(m, kReal), 0, true}, \
      {damping, Bytes(m, kReal), 0, true}, {                                \
    frequency, Bytes(m, kReal), 0, true                                     \
  }

// The pencil on either route; the automatic choice also sets the work estimate.
template <typename T>
int32_t Pencil(const T* x, int32_t n, int32_t pencil, int32_t order, double fs, int32_t real_signal,
               int32_t solver, double* amplitude, double* phase, double* damping, double* frequency,
               int32_t* modes, double* mse) {
  constexpr bool cx = std::is_same_v<T, Complex>;
  StatusCode check = checks::Pencil(n, pencil, order, fs, kWide);
  if (check == status::kOk && (solver < QDM_SOLVER_AUTO || solver > QDM_SOLVER_KRYLOV)) {
    check = kBadSolver;
  }
  const int32_t M = check == status::kOk ? order : 0;
  const int32_t L = check == status::kOk ? pencil : 0;
  PencilSolver route = static_cast<PencilSolver>(check == status::kOk ? solver : 0);
  if (route == PencilSolver::kAuto) {
    route = PencilPrefersKrylov(n, L, M, cx) ? PencilSolver::kKrylov : PencilSolver::kDense;
  }
  const size_t e = cx ? kCx : kReal;
  const double work =
      (route == PencilSolver::kKrylov ? PencilKrylovWork(n, M, e) : PencilWork(n, L, e)) +
      ModeFitWork(n, M);
  return RunPlain({check,
                   {x, n, cx},
                   {amplitude, phase, damping, frequency, modes, mse},
                   work,
                   &fs,
                   {QDM_MODE_OUTPUTS(M)},
                   {{mse, 2}},
                   modes},
                  [&](const void* xs) {
                    if constexpr (cx) {
                      return MatrixPencilSolverComplex(As<T>(xs), n, L, M, fs, route, amplitude,
                                                       phase, damping, frequency, mse, modes);
                    } else {
                      return MatrixPencilSolverReal(As<T>(xs), n, L, M, fs, real_signal, route,
                                                    amplitude, phase, damping, frequency, mse,
                                                    modes);
                    }
                  });
}

// The spectra evaluate 1/|A(f)|^2 exactly only on a grid of at least p + 1
// points; below it this face refuses the call.
StatusCode SpectrumCheck(StatusCode shared, int32_t points, int32_t order) {
  if (shared != status::kOk) return shared;
  return SpectrumLength(points) < int64_t{order} + 1 ? kSpectrumTooShort : status::kOk;
}

// The PCAR spectrum of either data type; real_signal is 0 for complex data,
// which have no conjugate pairs to fold.
template <typename T>
int32_t PcarSpectrum(const T* x, int32_t n, int32_t order, int32_t points, int32_t components,
                     double fs, int32_t real_signal, double* amplitude, double* phase,
                     double* frequency, int32_t* modes, double* spectrum, double* f0, double* df,
                     double* fit_error) {
  constexpr bool cx = std::is_same_v<T, Complex>;
  const StatusCode check =
      SpectrumCheck(checks::PcarSpectrum(n, order, components, points, fs, kWide), points, order);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  const int32_t k = check == status::kOk ? components : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain(
      {check,
       {x, n, cx},
       {amplitude, phase, frequency, modes, spectrum, f0, df, fit_error},
       LinearPredictionWork(n, p, cx ? kCx : kReal, 8) + ModeFitWork(n, k) + SpectrumWork(N),
       &fs,
       {{amplitude, Bytes(k, kReal), 1, true},
        {phase, Bytes(k, kReal), 0, true},
        {frequency, Bytes(k, kReal), 0, true},
        {spectrum, Bytes(N, kReal)}},
       {{f0}, {df}, {fit_error, 2}},
       modes},
      [&](const void* xs) {
        StatusCode s;
        if constexpr (cx) {
          s = PcarPowerSpectrumComplex(As<T>(xs), n, p, k, N, fs, amplitude, phase, frequency,
                                       fit_error, &result, modes);
        } else {
          s = PcarPowerSpectrumReal(As<T>(xs), n, p, k, N, fs, real_signal, amplitude, phase,
                                    frequency, fit_error, &result, modes);
        }
        *f0 = result.f0;
        *df = result.df;
        return s;
      });
}

}  // namespace

// ================================ the API ================================

extern "C" {

QDM_PLAIN_API const char* qdm_version(void) { return QDM_VERSION_STRING; }

QDM_PLAIN_API const char* qdm_status_text(int32_t code) {
#define QDM_STATUS_TEXT_CASE(name, value, text) \
  case value:                                   \
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

QDM_PLAIN_API int32_t qdm_output_room(int32_t n, int32_t size) {
  if (n < 1 || size < 1) return 0;
  return static_cast<int32_t>(std::min<int64_t>(size, MaxOrderWide(n)));
}

QDM_PLAIN_API int32_t qdm_default_pencil(int32_t n) { return n < 1 ? 0 : n / 3; }

QDM_PLAIN_API int32_t qdm_default_mdl_upper(int32_t n) {
  constexpr int32_t kCap = 64;  // keeps the O(n m + m^3) search small on long records
  // floor(2n/3) >= 2 from n = 3 on, so 2 (the least upper order above
  // min_order 1) always passes there; below it nothing does.
  if (n < 3) return 0;
  return std::clamp(n / 3, int32_t{2}, kCap);
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

QDM_PLAIN_API int32_t qdm_pcar_real(const double* x, int32_t n, int32_t order, int32_t components,
                                    double* coefficients, qdm_complex* roots) {
  return Pcar(x, n, order, components, QDM_SOLVER_AUTO, coefficients, roots);
}

QDM_PLAIN_API int32_t qdm_pcar_complex(const qdm_complex* x, int32_t n, int32_t order,
                                       int32_t components, qdm_complex* coefficients,
                                       qdm_complex* roots) {
  return Pcar(AsComplex(x), n, order, components, QDM_SOLVER_AUTO, AsComplex(coefficients), roots);
}

QDM_PLAIN_API int32_t qdm_pcar_solver_real(const double* x, int32_t n, int32_t order,
                                           int32_t components, int32_t solver, double* coefficients,
                                           qdm_complex* roots) {
  return Pcar(x, n, order, components, solver, coefficients, roots);
}

QDM_PLAIN_API int32_t qdm_pcar_solver_complex(const qdm_complex* x, int32_t n, int32_t order,
                                              int32_t components, int32_t solver,
                                              qdm_complex* coefficients, qdm_complex* roots) {
  return Pcar(AsComplex(x), n, order, components, solver, AsComplex(coefficients), roots);
}

// ---- Prony --------------------------------------------------------------------------------

QDM_PLAIN_API int32_t qdm_prony_real(const double* x, int32_t n, int32_t order, double fs,
                                     int32_t real_signal, double* amplitude, double* phase,
                                     double* damping, double* frequency, int32_t* modes) {
  const StatusCode check = checks::Prony(n, order, fs, kWide);
  const int32_t p = check == status::kOk ? order : 0;
  return RunPlain({check,
                   {x, n, false},
                   {amplitude, phase, damping, frequency, modes},
                   LinearPredictionWork(n, p, kReal, 4) + ModeFitWork(n, p),
                   &fs,
                   {QDM_MODE_OUTPUTS(p)},
                   {},
                   modes},
                  [&](const void* xs) {
                    return PronyReal(As<double>(xs), n, p, fs, real_signal, amplitude, phase,
                                     damping, frequency, modes);
                  });
}

QDM_PLAIN_API int32_t qdm_prony_complex(const qdm_complex* x, int32_t n, int32_t order, double fs,
                                        double* amplitude, double* phase, double* damping,
                                        double* frequency, int32_t* modes) {
  const StatusCode check = checks::Prony(n, order, fs, kWide);
  const int32_t p = check == status::kOk ? order : 0;
  return RunPlain({check,
                   {x, n, true},
                   {amplitude, phase, damping, frequency, modes},
                   LinearPredictionWork(n, p, kCx, 4) + ModeFitWork(n, p),
                   &fs,
                   {QDM_MODE_OUTPUTS(p)},
                   {},
                   modes},
                  [&](const void* xs) {
                    return PronyComplex(As<Complex>(xs), n, p, fs, amplitude, phase, damping,
                                        frequency, modes);
                  });
}

// ---- matrix pencil ----------------------------------------------------------------------

QDM_PLAIN_API int32_t qdm_matrix_pencil_real(const double* x, int32_t n, int32_t pencil,
                                             int32_t order, double fs, int32_t real_signal,
                                             double* amplitude, double* phase, double* damping,
                                             double* frequency, int32_t* modes, double* mse) {
  return Pencil(x, n, pencil, order, fs, real_signal, QDM_SOLVER_AUTO, amplitude, phase, damping,
                frequency, modes, mse);
}

QDM_PLAIN_API int32_t qdm_matrix_pencil_complex(const qdm_complex* x, int32_t n, int32_t pencil,
                                                int32_t order, double fs, double* amplitude,
                                                double* phase, double* damping, double* frequency,
                                                int32_t* modes, double* mse) {
  return Pencil(AsComplex(x), n, pencil, order, fs, 0, QDM_SOLVER_AUTO, amplitude, phase, damping,
                frequency, modes, mse);
}

QDM_PLAIN_API int32_t qdm_matrix_pencil_solver_real(const double* x, int32_t n, int32_t pencil,
                                                    int32_t order, double fs, int32_t real_signal,
                                                    int32_t solver, double* amplitude,
                                                    double* phase, double* damping,
                                                    double* frequency, int32_t* modes,
                                                    double* mse) {
  return Pencil(x, n, pencil, order, fs, real_signal, solver, amplitude, phase, damping, frequency,
                modes, mse);
}

QDM_PLAIN_API int32_t qdm_matrix_pencil_solver_complex(const qdm_complex* x, int32_t n,
                                                       int32_t pencil, int32_t order, double fs,
                                                       int32_t solver, double* amplitude,
                                                       double* phase, double* damping,
                                                       double* frequency, int32_t* modes,
                                                       double* mse) {
  return Pencil(AsComplex(x), n, pencil, order, fs, 0, solver, amplitude, phase, damping, frequency,
                modes, mse);
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
  const StatusCode check =
      SpectrumCheck(checks::CovSpectrum(n, order, points, fs, kWide), points, order);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain({check,
                   {x, n, false},
                   {spectrum, f0, df, noise_variance},
                   LinearPredictionWork(n, p, kReal, 4) + SpectrumWork(N),
                   &fs,
                   {{spectrum, Bytes(N, kReal)}},
                   {{f0}, {df}, {noise_variance, 2}},
                   nullptr},
                  [&](const void* xs) {
                    const StatusCode s =
                        CovPowerSpectrumReal(As<double>(xs), n, p, N, fs, &result, noise_variance);
                    *f0 = result.f0;
                    *df = result.df;
                    return s;
                  });
}

QDM_PLAIN_API int32_t qdm_covariance_psd_complex(const qdm_complex* x, int32_t n, int32_t order,
                                                 int32_t points, double fs, double* spectrum,
                                                 double* f0, double* df, double* noise_variance) {
  const StatusCode check =
      SpectrumCheck(checks::CovSpectrum(n, order, points, fs, kWide), points, order);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain({check,
                   {x, n, true},
                   {spectrum, f0, df, noise_variance},
                   LinearPredictionWork(n, p, kCx, 4) + SpectrumWork(N),
                   &fs,
                   {{spectrum, Bytes(N, kReal)}},
                   {{f0}, {df}, {noise_variance, 2}},
                   nullptr},
                  [&](const void* xs) {
                    const StatusCode s = CovPowerSpectrumComplex(As<Complex>(xs), n, p, N, fs,
                                                                 &result, noise_variance);
                    *f0 = result.f0;
                    *df = result.df;
                    return s;
                  });
}

QDM_PLAIN_API int32_t qdm_pcar_psd_real(const double* x, int32_t n, int32_t order, int32_t points,
                                        int32_t components, double fs, int32_t real_signal,
                                        double* amplitude, double* phase, double* frequency,
                                        int32_t* modes, double* spectrum, double* f0, double* df,
                                        double* fit_error) {
  return PcarSpectrum(x, n, order, points, components, fs, real_signal, amplitude, phase, frequency,
                      modes, spectrum, f0, df, fit_error);
}

QDM_PLAIN_API int32_t qdm_pcar_psd_complex(const qdm_complex* x, int32_t n, int32_t order,
                                           int32_t points, int32_t components, double fs,
                                           double* amplitude, double* phase, double* frequency,
                                           int32_t* modes, double* spectrum, double* f0, double* df,
                                           double* fit_error) {
  return PcarSpectrum(AsComplex(x), n, order, points, components, fs, 0, amplitude, phase,
                      frequency, modes, spectrum, f0, df, fit_error);
}

}  // extern "C"

#undef QDM_MODE_OUTPUTS
