// Batches: one fit over many records of one length, the rows of a strided
// array, on a number of threads. Each record goes through the single-record
// function itself, so its results, status and checks are that function's, bit
// for bit; the batch adds the layout, the threads and one status per record.
#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>

#include "api/last_error.h"
#include "api/plain_face.h"
#include "core/platform.h"
#include "qdm_api.h"

namespace {

// Where the records are and where their statuses go.
struct Layout {
  int64_t count;
  int64_t distance;  // samples from the first of one record to the first of the next
  int32_t n;
  int32_t* status;
  int32_t threads;
};

// What one thread keeps of its records: the first that failed (it takes them
// in increasing order) and that record's message.
struct Worker {
  int64_t failed = -1;
  char message[256] = "";
};

template <typename Record>
struct Run {
  const Record* record;
  int64_t count;
  int32_t* status;
  std::atomic<int64_t> next{0};
  std::atomic<int> slots{0};
  Worker workers[platform::kMaxThreads];
};

// Records are handed out one at a time: a fit costs far more than the atomic
// increment, and records that fail early or converge slowly even out.
template <typename Record>
void Work(void* context) {
  auto& run = *static_cast<Run<Record>*>(context);
  Worker& w = run.workers[run.slots++];
  for (int64_t i; (i = run.next++) < run.count;) {
    const int32_t s = (*run.record)(i);
    run.status[i] = s;
    if (s < 0 && w.failed < 0) {
      w.failed = i;
      qdm_last_error_message(w.message, sizeof w.message);
    }
  }
}

// The batch's own checks: a layout the address space holds. `values` is the
// most doubles one record writes to any one output array.
int32_t CheckLayout(const Layout& b, size_t element, int64_t values) {
  if (b.count < 0)
    return last_error::Refuse(QDM_ERR_BATCH, "count", double(b.count), "is negative");
  if (b.distance < 0)
    return last_error::Refuse(QDM_ERR_BATCH, "distance", double(b.distance), "is negative");
  if (b.threads < 0) return last_error::Refuse(QDM_ERR_BATCH, "threads", b.threads, "is negative");
  if (b.status == nullptr) return last_error::Null("status");
  // Every offset the batch forms, i * distance or i * row for i < count, must
  // stay a valid pointer difference.
  const double bytes = double(std::max(b.distance, int64_t{std::max(b.n, 1)})) * double(element) +
                       double(values) * 2.0 * sizeof(double);
  const double most = std::floor(double(PTRDIFF_MAX) / bytes);
  if (double(b.count) > most) {
    return last_error::RefuseAgainst(QDM_ERR_BATCH, "count", double(b.count), "is above",
                                     "the records of this size the address space holds", most);
  }
  return QDM_OK;
}

// Checks the layout and the single function's arguments (on the first
// record's pointers, nothing read), then fits every record. Returns the
// argument error that concerns them all, QDM_OK, or QDM_WARN_RECORD_FAILED
// when some record's status is an error.
template <typename Record>
int32_t RunBatch(const Layout& b, size_t element, int64_t values, const Record& record) {
  last_error::Begin();
  if (const int32_t s = CheckLayout(b, element, values); s != QDM_OK) return last_error::End(s);
  {
    const plain::Admission admission;
    if (const int32_t s = record(0); s != QDM_OK) return s;  // its message is recorded
  }
  auto run = std::make_unique<Run<Record>>();
  run->record = &record;
  run->count = b.count;
  run->status = b.status;
  const int64_t wanted = b.threads == 0 ? platform::Processors() : b.threads;
  const int threads = static_cast<int>(std::min<int64_t>({wanted, b.count, platform::kMaxThreads}));
  platform::RunOnThreads(std::max(threads, 1), Work<Record>, run.get());

  const Worker* first = nullptr;
  for (const Worker& w : run->workers) {
    if (w.failed >= 0 && (first == nullptr || w.failed < first->failed)) first = &w;
  }
  last_error::Begin();
  if (first == nullptr) return last_error::End(QDM_OK);
  char text[384];
  std::snprintf(
      text, sizeof text, "record %lld: %s", static_cast<long long>(first->failed),
      first->message[0] != '\0' ? first->message : qdm_status_text(b.status[first->failed]));
  return last_error::Text(QDM_WARN_RECORD_FAILED, text);
}

constexpr size_t kReal = sizeof(double);
constexpr size_t kPair = sizeof(qdm_complex);

template <typename T>
constexpr size_t Element() {
  return sizeof(T);
}

// Row i of an output array of `row` values per record.
template <typename T>
T* Row(T* out, int64_t i, int64_t row) {
  return out == nullptr ? nullptr : out + i * row;
}

int64_t Positive(int32_t v) { return v > 0 ? v : 0; }

int64_t SpectrumValues(int32_t points) { return qdm_spectrum_length(points); }

}  // namespace

namespace {

template <typename T, typename F>
int32_t CovarianceBatch(F single, const T* x, int32_t n, int64_t count, int64_t distance,
                        int32_t order, T* coefficients, qdm_complex* poles, double* variance,
                        int32_t* status, int32_t threads) {
  const int64_t p = Positive(order);
  return RunBatch(Layout{count, distance, n, status, threads}, Element<T>(), p + 1, [&](int64_t i) {
    return single(x + i * distance, n, order, Row(coefficients, i, p + 1), Row(poles, i, p),
                  Row(variance, i, 1));
  });
}

template <typename T, typename F>
int32_t PcarBatch(F single, const T* x, int32_t n, int64_t count, int64_t distance, int32_t order,
                  int32_t components, int32_t solver, T* coefficients, qdm_complex* roots,
                  int32_t* status, int32_t threads) {
  const int64_t p = Positive(order);
  return RunBatch(Layout{count, distance, n, status, threads}, Element<T>(), p + 1, [&](int64_t i) {
    return single(x + i * distance, n, order, components, solver, Row(coefficients, i, p + 1),
                  Row(roots, i, p));
  });
}

template <typename T, typename F>
int32_t MdlBatch(F single, const T* x, int32_t n, int64_t count, int64_t distance, int32_t pencil,
                 int32_t min_order, int32_t* order, int32_t* status, int32_t threads) {
  return RunBatch(Layout{count, distance, n, status, threads}, Element<T>(), 1, [&](int64_t i) {
    return single(x + i * distance, n, pencil, min_order, Row(order, i, 1));
  });
}

template <typename T, typename F>
int32_t CovPsdBatch(F single, const T* x, int32_t n, int64_t count, int64_t distance, int32_t order,
                    int32_t points, double fs, double* spectrum, double* f0, double* df,
                    double* variance, int32_t* status, int32_t threads) {
  const int64_t N = SpectrumValues(points);
  return RunBatch(Layout{count, distance, n, status, threads}, Element<T>(), N, [&](int64_t i) {
    return single(x + i * distance, n, order, points, fs, Row(spectrum, i, N), Row(f0, i, 1),
                  Row(df, i, 1), Row(variance, i, 1));
  });
}

}  // namespace

extern "C" {

QDM_PLAIN_API int32_t qdm_covariance_batch_real(const double* x, int32_t n, int64_t count,
                                                int64_t distance, int32_t order,
                                                double* coefficients, qdm_complex* poles,
                                                double* noise_variance, int32_t* status,
                                                int32_t threads) {
  return CovarianceBatch(qdm_covariance_real, x, n, count, distance, order, coefficients, poles,
                         noise_variance, status, threads);
}

QDM_PLAIN_API int32_t qdm_covariance_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                                   int64_t distance, int32_t order,
                                                   qdm_complex* coefficients, qdm_complex* poles,
                                                   double* noise_variance, int32_t* status,
                                                   int32_t threads) {
  return CovarianceBatch(qdm_covariance_complex, x, n, count, distance, order, coefficients, poles,
                         noise_variance, status, threads);
}

QDM_PLAIN_API int32_t qdm_pcar_batch_real(const double* x, int32_t n, int64_t count,
                                          int64_t distance, int32_t order, int32_t components,
                                          int32_t solver, double* coefficients, qdm_complex* roots,
                                          int32_t* status, int32_t threads) {
  return PcarBatch(qdm_pcar_solver_real, x, n, count, distance, order, components, solver,
                   coefficients, roots, status, threads);
}

QDM_PLAIN_API int32_t qdm_pcar_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                             int64_t distance, int32_t order, int32_t components,
                                             int32_t solver, qdm_complex* coefficients,
                                             qdm_complex* roots, int32_t* status, int32_t threads) {
  return PcarBatch(qdm_pcar_solver_complex, x, n, count, distance, order, components, solver,
                   coefficients, roots, status, threads);
}

// The modal fits: the real twins take the real-signal flag, the complex ones
// do not, so their bodies are written out beside each other.
QDM_PLAIN_API int32_t qdm_prony_batch_real(const double* x, int32_t n, int64_t count,
                                           int64_t distance, int32_t order, double fs,
                                           int32_t real_signal, double* amplitude, double* phase,
                                           double* damping, double* frequency, int32_t* modes,
                                           int32_t* status, int32_t threads) {
  const int64_t p = Positive(order);
  return RunBatch(Layout{count, distance, n, status, threads}, kReal, p, [&](int64_t i) {
    return qdm_prony_real(x + i * distance, n, order, fs, real_signal, Row(amplitude, i, p),
                          Row(phase, i, p), Row(damping, i, p), Row(frequency, i, p),
                          Row(modes, i, 1));
  });
}

QDM_PLAIN_API int32_t qdm_prony_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                              int64_t distance, int32_t order, double fs,
                                              double* amplitude, double* phase, double* damping,
                                              double* frequency, int32_t* modes, int32_t* status,
                                              int32_t threads) {
  const int64_t p = Positive(order);
  return RunBatch(Layout{count, distance, n, status, threads}, kPair, p, [&](int64_t i) {
    return qdm_prony_complex(x + i * distance, n, order, fs, Row(amplitude, i, p), Row(phase, i, p),
                             Row(damping, i, p), Row(frequency, i, p), Row(modes, i, 1));
  });
}

QDM_PLAIN_API int32_t qdm_matrix_pencil_batch_real(const double* x, int32_t n, int64_t count,
                                                   int64_t distance, int32_t pencil, int32_t order,
                                                   double fs, int32_t real_signal, int32_t solver,
                                                   double* amplitude, double* phase,
                                                   double* damping, double* frequency,
                                                   int32_t* modes, double* mse, int32_t* status,
                                                   int32_t threads) {
  const int64_t m = Positive(order);
  return RunBatch(Layout{count, distance, n, status, threads}, kReal, m, [&](int64_t i) {
    return qdm_matrix_pencil_solver_real(x + i * distance, n, pencil, order, fs, real_signal,
                                         solver, Row(amplitude, i, m), Row(phase, i, m),
                                         Row(damping, i, m), Row(frequency, i, m), Row(modes, i, 1),
                                         Row(mse, i, 1));
  });
}

QDM_PLAIN_API int32_t qdm_matrix_pencil_batch_complex(
    const qdm_complex* x, int32_t n, int64_t count, int64_t distance, int32_t pencil, int32_t order,
    double fs, int32_t solver, double* amplitude, double* phase, double* damping, double* frequency,
    int32_t* modes, double* mse, int32_t* status, int32_t threads) {
  const int64_t m = Positive(order);
  return RunBatch(Layout{count, distance, n, status, threads}, kPair, m, [&](int64_t i) {
    return qdm_matrix_pencil_solver_complex(
        x + i * distance, n, pencil, order, fs, solver, Row(amplitude, i, m), Row(phase, i, m),
        Row(damping, i, m), Row(frequency, i, m), Row(modes, i, 1), Row(mse, i, 1));
  });
}

QDM_PLAIN_API int32_t qdm_mdl_order_batch_real(const double* x, int32_t n, int64_t count,
                                               int64_t distance, int32_t pencil, int32_t min_order,
                                               int32_t* order, int32_t* status, int32_t threads) {
  return MdlBatch(qdm_mdl_order_real, x, n, count, distance, pencil, min_order, order, status,
                  threads);
}

QDM_PLAIN_API int32_t qdm_mdl_order_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                                  int64_t distance, int32_t pencil,
                                                  int32_t min_order, int32_t* order,
                                                  int32_t* status, int32_t threads) {
  return MdlBatch(qdm_mdl_order_complex, x, n, count, distance, pencil, min_order, order, status,
                  threads);
}

QDM_PLAIN_API int32_t qdm_covariance_psd_batch_real(const double* x, int32_t n, int64_t count,
                                                    int64_t distance, int32_t order, int32_t points,
                                                    double fs, double* spectrum, double* f0,
                                                    double* df, double* noise_variance,
                                                    int32_t* status, int32_t threads) {
  return CovPsdBatch(qdm_covariance_psd_real, x, n, count, distance, order, points, fs, spectrum,
                     f0, df, noise_variance, status, threads);
}

QDM_PLAIN_API int32_t qdm_covariance_psd_batch_complex(const qdm_complex* x, int32_t n,
                                                       int64_t count, int64_t distance,
                                                       int32_t order, int32_t points, double fs,
                                                       double* spectrum, double* f0, double* df,
                                                       double* noise_variance, int32_t* status,
                                                       int32_t threads) {
  return CovPsdBatch(qdm_covariance_psd_complex, x, n, count, distance, order, points, fs, spectrum,
                     f0, df, noise_variance, status, threads);
}

QDM_PLAIN_API int32_t qdm_pcar_psd_batch_real(const double* x, int32_t n, int64_t count,
                                              int64_t distance, int32_t order, int32_t points,
                                              int32_t components, double fs, int32_t real_signal,
                                              double* amplitude, double* phase, double* frequency,
                                              int32_t* modes, double* spectrum, double* f0,
                                              double* df, double* fit_error, int32_t* status,
                                              int32_t threads) {
  const int64_t k = Positive(components), N = SpectrumValues(points);
  return RunBatch(
      Layout{count, distance, n, status, threads}, kReal, std::max(k, N), [&](int64_t i) {
        return qdm_pcar_psd_real(x + i * distance, n, order, points, components, fs, real_signal,
                                 Row(amplitude, i, k), Row(phase, i, k), Row(frequency, i, k),
                                 Row(modes, i, 1), Row(spectrum, i, N), Row(f0, i, 1),
                                 Row(df, i, 1), Row(fit_error, i, 1));
      });
}

QDM_PLAIN_API int32_t qdm_pcar_psd_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                                 int64_t distance, int32_t order, int32_t points,
                                                 int32_t components, double fs, double* amplitude,
                                                 double* phase, double* frequency, int32_t* modes,
                                                 double* spectrum, double* f0, double* df,
                                                 double* fit_error, int32_t* status,
                                                 int32_t threads) {
  const int64_t k = Positive(components), N = SpectrumValues(points);
  return RunBatch(
      Layout{count, distance, n, status, threads}, kPair, std::max(k, N), [&](int64_t i) {
        return qdm_pcar_psd_complex(x + i * distance, n, order, points, components, fs,
                                    Row(amplitude, i, k), Row(phase, i, k), Row(frequency, i, k),
                                    Row(modes, i, 1), Row(spectrum, i, N), Row(f0, i, 1),
                                    Row(df, i, 1), Row(fit_error, i, 1));
      });
}

}  // extern "C"

namespace {

// The error bars of a batch of fits: record i has modes[i] modes in row i of
// `room` values. A count outside 1..room is that record's own error.
template <typename T, typename F>
int32_t ModeErrorsBatch(F single, const T* x, int32_t n, int64_t count, int64_t distance,
                        int32_t room, const int32_t* modes, const double* const in[4],
                        double* const out[4], double* noise_variance, int32_t* status,
                        int32_t threads) {
  if (room < 1) {
    last_error::Begin();
    return last_error::End(last_error::Refuse(QDM_ERR_NO_MODES, "room", room, "is below 1"));
  }
  if (modes == nullptr) {
    last_error::Begin();
    return last_error::End(last_error::Null("modes"));
  }
  return RunBatch(Layout{count, distance, n, status, threads}, Element<T>(), room, [&](int64_t i) {
    // The arguments are checked for one mode per record; each
    // record's count is its own.
    const int32_t m = plain::Admitting() ? 1 : modes[i];
    if (m > room) {
      last_error::Begin();
      return last_error::End(
          last_error::RefuseAgainst(QDM_ERR_ROOM, "modes", m, "is above", "room", room));
    }
    return single(x + i * distance, n, m, Row(in[0], i, room), Row(in[1], i, room),
                  Row(in[2], i, room), Row(in[3], i, room), Row(out[0], i, room),
                  Row(out[1], i, room), Row(out[2], i, room), Row(out[3], i, room),
                  Row(noise_variance, i, 1));
  });
}

}  // namespace

extern "C" {

QDM_PLAIN_API int32_t qdm_mode_errors_batch_real(
    const double* x, int32_t n, int64_t count, int64_t distance, double fs, int32_t real_signal,
    int32_t room, const int32_t* modes, const double* amplitude, const double* phase,
    const double* damping, const double* frequency, double* amplitude_se, double* phase_se,
    double* damping_se, double* frequency_se, double* noise_variance, int32_t* status,
    int32_t threads) {
  const double* const in[4] = {amplitude, phase, damping, frequency};
  double* const out[4] = {amplitude_se, phase_se, damping_se, frequency_se};
  const auto single = [&](const double* xs, int32_t nn, int32_t m, const double* a,
                          const double* ph, const double* d, const double* f, double* ae,
                          double* pe, double* de, double* fe, double* v) {
    return qdm_mode_errors_real(xs, nn, fs, real_signal, m, a, ph, d, f, ae, pe, de, fe, v);
  };
  return ModeErrorsBatch(single, x, n, count, distance, room, modes, in, out, noise_variance,
                         status, threads);
}

QDM_PLAIN_API int32_t qdm_mode_errors_batch_complex(
    const qdm_complex* x, int32_t n, int64_t count, int64_t distance, double fs, int32_t room,
    const int32_t* modes, const double* amplitude, const double* phase, const double* damping,
    const double* frequency, double* amplitude_se, double* phase_se, double* damping_se,
    double* frequency_se, double* noise_variance, int32_t* status, int32_t threads) {
  const double* const in[4] = {amplitude, phase, damping, frequency};
  double* const out[4] = {amplitude_se, phase_se, damping_se, frequency_se};
  const auto single = [&](const qdm_complex* xs, int32_t nn, int32_t m, const double* a,
                          const double* ph, const double* d, const double* f, double* ae,
                          double* pe, double* de, double* fe, double* v) {
    return qdm_mode_errors_complex(xs, nn, fs, m, a, ph, d, f, ae, pe, de, fe, v);
  };
  return ModeErrorsBatch(single, x, n, count, distance, room, modes, in, out, noise_variance,
                         status, threads);
}

}  // extern "C"
