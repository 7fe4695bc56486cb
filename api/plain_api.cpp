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

#include "api/last_error.h"
#include "api/plain_face.h"
#include "core/call_record.h"
#include "core/scalar.h"
#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "numeric/work.h"
#include "qdm_api.h"

namespace {

// ---- one table of codes: the public numbering is the internal one mapped as
// the host maps it ------------------------------------------------------------------
using plain::PublicCode;
using plain::RecordScale;
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

// A pointer the call dereferences, named as the header names it.
struct Required {
  const void* pointer;
  const char* name;
};

struct PlainCall {
  StatusCode check;  // the argument checks' verdict, its failure already recorded
  Samples x;
  std::initializer_list<Required> required;  // pointers the call dereferences
  double work_bytes;                         // estimated work memory
  const double* rate;                        // sampling rate, or null
  std::initializer_list<OutArray> outputs;   // zero-filled on failure
  std::initializer_list<OutDouble> doubles;  // 0.0 on failure
  int32_t* count;                            // 0 on failure, or null
};

// The largest magnitude among the samples, or -1 when one is NaN or infinite.
double Extent(const Samples& x) {
  return plain::Extent(static_cast<const double*>(x.data), int64_t{x.n} * (x.complex ? 2 : 1));
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
int32_t RunChecked(const PlainCall& call, const Fit& fit) {
  if (call.check != status::kOk) return PublicCode(call.check);
  if (call.x.data == nullptr) return last_error::Null("x");
  for (const Required& r : call.required) {
    if (r.pointer == nullptr) return last_error::Null(r.name);
  }
  if (call.work_bytes > static_cast<double>(QDM_MAX_WORK_BYTES)) {
    return last_error::WorkLimit(call.work_bytes, call.x.n);
  }
  if (call.rate != nullptr && !std::isfinite(*call.rate)) {
    return last_error::NotFinite("fs", *call.rate);
  }
  if (plain::Admitting()) return QDM_OK;
  const double largest = Extent(call.x);
  if (largest < 0.0) {
    const int64_t values = int64_t{call.x.n} * (call.x.complex ? 2 : 1);
    return last_error::NotFiniteSample(static_cast<const double*>(call.x.data), values,
                                       call.x.complex);
  }

  const int scale = RecordScale(largest);
  StatusCode s = status::kOk;
  WorkArray<double> scaled;
  const void* samples = call.x.data;
  if (scale != 0) {
    const size_t values = static_cast<size_t>(call.x.n) * (call.x.complex ? 2 : 1);
    scaled = plain::ScaledCopy(static_cast<const double*>(call.x.data), values, scale);
    if (!scaled) s = status::kNoMemory;
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

// Every call of the face through here leaves its status in the thread's record.
template <typename Fit>
int32_t RunPlain(const PlainCall& call, const Fit& fit) {
  return last_error::End(RunChecked(call, fit));
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
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check = checks::Covariance(n, p, kWide, last_error::Begin());
  const size_t e = cx ? kCx : kReal;
  const int32_t q = check == status::kOk ? p : 0;
  return RunPlain({check,
                   {x, n, cx},
                   {{a, "coefficients"}, {poles, "poles"}, {variance, "noise_variance"}},
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

// The shared checks, then this face's own: a solver route it knows.
StatusCode SolverCheck(StatusCode shared, int32_t solver) {
  if (shared != status::kOk) return shared;
  if (solver >= QDM_SOLVER_AUTO && solver <= QDM_SOLVER_KRYLOV) return status::kOk;
  last_error::Refuse(QDM_ERR_SOLVER, "solver", solver, "is not one of",
                     "QDM_SOLVER_AUTO, QDM_SOLVER_DENSE, QDM_SOLVER_KRYLOV (0, 1, 2)");
  return kBadSolver;
}

// PCAR on either route; the automatic choice also sets the work estimate.
template <typename T>
int32_t Pcar(const T* x, int32_t n, int32_t order, int32_t components, int32_t solver, T* a,
             qdm_complex* roots) {
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check =
      SolverCheck(checks::Pcar(n, order, components, kWide, last_error::Begin()), solver);
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
                   {{a, "coefficients"}, {roots, "roots"}},
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
// The order search on the record divided by its root mean square. The score's
// fixed constants (the starting score 10000 and the error floor 2.2e-16) then
// weigh the fitting error against the record's own power, so the order does
// not depend on the record's units: x and c x give the same order for any
// c != 0, up to the rounding of the division. An all-zero record is searched
// as it is.
template <typename T>
StatusCode MdlOfUnitPower(const T* x, int32_t n, int32_t L, int32_t min_order, int32_t* order) {
  double power = 0.0;
  for (int32_t i = 0; i < n; ++i) power += AbsSquared(x[i]);
  const double rms = std::sqrt(power / n);
  WorkArray<T> unit = AllocWorkUninit<T>(rms > 0.0 ? static_cast<size_t>(n) : 0);
  if (rms > 0.0 && !unit) return status::kNoMemory;
  if (rms > 0.0) {
    for (int32_t i = 0; i < n; ++i) unit[i] = x[i] / rms;
  }
  const T* searched = rms > 0.0 ? unit.get() : x;
  if constexpr (kIsComplex<T>) {
    return MdlOrderComplex(searched, n, L, min_order, order);
  } else {
    return MdlOrderReal(searched, n, L, min_order, order);
  }
}

template <typename T>
int32_t Mdl(const T* x, int32_t n, int32_t pencil, int32_t min_order, int32_t* order) {
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check = checks::Mdl(n, pencil, min_order, kWide, last_error::Begin());
  const int32_t L = check == status::kOk ? pencil : 0;
  return RunPlain(
      {check,
       {x, n, cx},
       {{order, "order"}},
       PencilWork(n, L, cx ? kCx : kReal) + ModeFitWork(n, L) +
           static_cast<double>(Bytes(n, cx ? kCx : kReal)),
       nullptr,
       {},
       {},
       order},
      [&](const void* xs) { return MdlOfUnitPower(As<T>(xs), n, L, min_order, order); });
}

// The mode arrays of Prony and the pencil: m values each, counted by *modes.
#define QDM_MODE_OUTPUTS(m)                                                 \
  {amplitude, Bytes(m, kReal), 1, true}, {phase, Bytes(m, kReal), 0, true}, \
      {damping, Bytes(m, kReal), 0, true}, {                                \
    frequency, Bytes(m, kReal), 0, true                                     \
  }

// Prony of either data type; real_signal is 0 for complex data, which have no
// conjugate pairs to fold.
template <typename T>
int32_t Prony(const T* x, int32_t n, int32_t order, double fs, int32_t real_signal,
              double* amplitude, double* phase, double* damping, double* frequency,
              int32_t* modes) {
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check = checks::Prony(n, order, fs, kWide, last_error::Begin());
  const int32_t p = check == status::kOk ? order : 0;
  return RunPlain({check,
                   {x, n, cx},
                   {{amplitude, "amplitude"},
                    {phase, "phase"},
                    {damping, "damping"},
                    {frequency, "frequency"},
                    {modes, "modes"}},
                   LinearPredictionWork(n, p, cx ? kCx : kReal, 4) + ModeFitWork(n, p),
                   &fs,
                   {QDM_MODE_OUTPUTS(p)},
                   {},
                   modes},
                  [&](const void* xs) {
                    if constexpr (cx) {
                      return PronyComplex(As<T>(xs), n, p, fs, amplitude, phase, damping, frequency,
                                          modes);
                    } else {
                      return PronyReal(As<T>(xs), n, p, fs, real_signal, amplitude, phase, damping,
                                       frequency, modes);
                    }
                  });
}

// The pencil on either route; the automatic choice also sets the work estimate.
// real_signal is 0 for complex data, which have no conjugate pairs to fold.
template <typename T>
int32_t Pencil(const T* x, int32_t n, int32_t pencil, int32_t order, double fs, int32_t real_signal,
               int32_t solver, double* amplitude, double* phase, double* damping, double* frequency,
               int32_t* modes, double* mse) {
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check =
      SolverCheck(checks::Pencil(n, pencil, order, fs, kWide, last_error::Begin()), solver);
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
                   {{amplitude, "amplitude"},
                    {phase, "phase"},
                    {damping, "damping"},
                    {frequency, "frequency"},
                    {modes, "modes"},
                    {mse, "mse"}},
                   work,
                   &fs,
                   {QDM_MODE_OUTPUTS(M)},
                   {{mse, 2}},
                   modes},
                  [&](const void* xs) {
                    if constexpr (cx) {
                      return MatrixPencilSolverComplex(As<T>(xs), n, L, M, fs, route, amplitude,
                                                       phase, damping, frequency, modes, mse);
                    } else {
                      return MatrixPencilSolverReal(As<T>(xs), n, L, M, fs, real_signal, route,
                                                    amplitude, phase, damping, frequency, modes,
                                                    mse);
                    }
                  });
}

// The spectra evaluate 1/|A(f)|^2 exactly only on a grid of at least p + 1
// points; below it this face refuses the call.
StatusCode SpectrumCheck(StatusCode shared, int32_t points, int32_t order) {
  if (shared != status::kOk) return shared;
  if (SpectrumLength(points) >= int64_t{order} + 1) return status::kOk;
  last_error::RefuseAgainst(QDM_ERR_SPECTRUM_TOO_SHORT, "points", points,
                            "gives fewer spectrum values than", "order + 1", order + 1.0);
  return kSpectrumTooShort;
}

// The covariance spectrum of either data type.
template <typename T>
int32_t CovSpectrum(const T* x, int32_t n, int32_t order, int32_t points, double fs,
                    double* spectrum, double* f0, double* df, double* noise_variance) {
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check = SpectrumCheck(
      checks::CovSpectrum(n, order, points, fs, kWide, last_error::Begin()), points, order);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain(
      {check,
       {x, n, cx},
       {{spectrum, "spectrum"}, {f0, "f0"}, {df, "df"}, {noise_variance, "noise_variance"}},
       LinearPredictionWork(n, p, cx ? kCx : kReal, 4) + SpectrumWork(N),
       &fs,
       {{spectrum, Bytes(N, kReal)}},
       {{f0}, {df}, {noise_variance, 2}},
       nullptr},
      [&](const void* xs) {
        StatusCode s;
        if constexpr (cx) {
          s = CovPowerSpectrumComplex(As<T>(xs), n, p, N, fs, &result, noise_variance);
        } else {
          s = CovPowerSpectrumReal(As<T>(xs), n, p, N, fs, &result, noise_variance);
        }
        *f0 = result.f0;
        *df = result.df;
        return s;
      });
}

// The PCAR spectrum of either data type; real_signal is 0 for complex data,
// which have no conjugate pairs to fold.
template <typename T>
int32_t PcarSpectrum(const T* x, int32_t n, int32_t order, int32_t points, int32_t components,
                     double fs, int32_t real_signal, double* amplitude, double* phase,
                     double* frequency, int32_t* modes, double* spectrum, double* f0, double* df,
                     double* fit_error) {
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check = SpectrumCheck(
      checks::PcarSpectrum(n, order, components, points, fs, kWide, last_error::Begin()), points,
      order);
  const int32_t N = check == status::kOk ? SpectrumLength(points) : 0;
  const int32_t p = check == status::kOk ? order : 0;
  const int32_t k = check == status::kOk ? components : 0;
  SpectrumResult result{0.0, 0.0, spectrum};
  return RunPlain(
      {check,
       {x, n, cx},
       {{amplitude, "amplitude"},
        {phase, "phase"},
        {frequency, "frequency"},
        {modes, "modes"},
        {spectrum, "spectrum"},
        {f0, "f0"},
        {df, "df"},
        {fit_error, "fit_error"}},
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
                                       modes, &result, fit_error);
        } else {
          s = PcarPowerSpectrumReal(As<T>(xs), n, p, k, N, fs, real_signal, amplitude, phase,
                                    frequency, modes, &result, fit_error);
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
  return Prony(x, n, order, fs, real_signal, amplitude, phase, damping, frequency, modes);
}

QDM_PLAIN_API int32_t qdm_prony_complex(const qdm_complex* x, int32_t n, int32_t order, double fs,
                                        double* amplitude, double* phase, double* damping,
                                        double* frequency, int32_t* modes) {
  return Prony(AsComplex(x), n, order, fs, 0, amplitude, phase, damping, frequency, modes);
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

QDM_PLAIN_API int32_t qdm_mdl_order_real(const double* x, int32_t n, int32_t pencil,
                                         int32_t min_order, int32_t* order) {
  return Mdl(x, n, pencil, min_order, order);
}

QDM_PLAIN_API int32_t qdm_mdl_order_complex(const qdm_complex* x, int32_t n, int32_t pencil,
                                            int32_t min_order, int32_t* order) {
  return Mdl(AsComplex(x), n, pencil, min_order, order);
}

// ---- spectra ------------------------------------------------------------------------------

QDM_PLAIN_API int32_t qdm_covariance_psd_real(const double* x, int32_t n, int32_t order,
                                              int32_t points, double fs, double* spectrum,
                                              double* f0, double* df, double* noise_variance) {
  return CovSpectrum(x, n, order, points, fs, spectrum, f0, df, noise_variance);
}

QDM_PLAIN_API int32_t qdm_covariance_psd_complex(const qdm_complex* x, int32_t n, int32_t order,
                                                 int32_t points, double fs, double* spectrum,
                                                 double* f0, double* df, double* noise_variance) {
  return CovSpectrum(AsComplex(x), n, order, points, fs, spectrum, f0, df, noise_variance);
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
