// The stabilization diagram on the plain face: the argument checks, null
// pointers, the work bound, non-finite samples, rate and tolerances, then the
// diagram and the order search on the same record. A record outside
// [2^-128, 2^128] is worked on scaled by a power of two, as the fits are,
// and the amplitudes scaled back.
#include <cfloat>
#include <cmath>
#include <cstring>

#include <utility>

#include "api/last_error.h"
#include "api/plain_face.h"
#include "core/call_record.h"
#include "core/scalar.h"
#include "core/types.h"
#include "estimation/entry_checks.h"
#include "estimation/stabilization.h"
#include "numeric/work.h"
#include "qdm_api.h"

namespace {

static_assert(-42400 - int32_t(status::kBadTolerance) == QDM_ERR_TOLERANCE);
static_assert(-42400 - int32_t(status::kTableRoom) == QDM_ERR_ROOM);
static_assert(kStableFrequency == QDM_STABLE_FREQUENCY && kStableDamping == QDM_STABLE_DAMPING &&
              kStable == QDM_STABLE);

using plain::Finite;
using plain::PublicCode;

// Work memory: the larger of the diagram (the pencil's data matrices, the
// pencil and its block, one order's amplitude fit) and the order search
// (its own pencil and amplitude fit, and the record at unit power). Only
// compared with the bound, so generous.
double Work(int32_t n, int32_t L, int32_t top, bool cx) {
  const double e = cx ? 16.0 : 8.0;
  const auto pencil = [&](int32_t l) { return e * (8.0 * double(n - l) * l + 8.0 * n); };
  const double fit = 16.0 * (3.0 * n * double(top) + 8.0 * n);
  const double diagram = pencil(L) + 2.0 * e * double(top) * top + fit;
  const double search = pencil(top) + fit + e * n;
  return diagram > search ? diagram : search;
}

void Clear(StabilizationTable* t, int32_t* mdl) {
  const size_t rows = static_cast<size_t>(t->room);
  std::memset(t->order, 0, rows * sizeof(int32_t));
  std::memset(t->frequency, 0, rows * sizeof(double));
  std::memset(t->damping, 0, rows * sizeof(double));
  std::memset(t->amplitude, 0, rows * sizeof(double));
  std::memset(t->flags, 0, rows * sizeof(int32_t));
  t->rows = 0;
  *mdl = 0;
}

// The amplitudes scaled back; every number of the written rows finite.
bool Screen(StabilizationTable* t, int scale) {
  bool good = true;
  for (int64_t i = 0; i < t->rows; ++i) {
    t->amplitude[i] = std::ldexp(t->amplitude[i], -scale);
    good = good && Finite(t->frequency[i]) && Finite(t->damping[i]) && Finite(t->amplitude[i]);
  }
  return good;
}

template <typename T>
int32_t Run(const T* x, int32_t n, const StabilizationRange& range, StabilizationTable table,
            int64_t* rows, int32_t* mdl) {
  constexpr bool cx = kIsComplex<T>;
  const StatusCode check = checks::Stabilization(
      n, range.L, range.minOrder, range.maxOrder, range.fs, range.freqTol, range.dampingTol,
      table.room, checks::Bound::kWide, last_error::Begin());
  if (check != status::kOk) return last_error::End(PublicCode(check));
  const std::pair<const void*, const char*> required[] = {{x, "x"},
                                                          {table.order, "order"},
                                                          {table.frequency, "frequency"},
                                                          {table.damping, "damping"},
                                                          {table.amplitude, "amplitude"},
                                                          {table.flags, "flags"},
                                                          {rows, "rows"},
                                                          {mdl, "mdl_order"}};
  for (const auto& [pointer, name] : required) {
    if (pointer == nullptr) return last_error::Null(name);
  }
  const double work = Work(n, range.L, range.maxOrder, cx);
  if (work > static_cast<double>(QDM_MAX_WORK_BYTES)) return last_error::WorkLimit(work, n);
  const size_t values = static_cast<size_t>(n) * (cx ? 2 : 1);
  const double* v = reinterpret_cast<const double*>(x);
  const double extent = plain::Extent(v, int64_t(values));
  if (extent < 0.0) return last_error::NotFiniteSample(v, int64_t(values), cx);
  if (!Finite(range.fs)) return last_error::NotFinite("fs", range.fs);
  if (!Finite(range.freqTol)) return last_error::NotFinite("freq_tol", range.freqTol);
  if (!Finite(range.dampingTol)) return last_error::NotFinite("damping_tol", range.dampingTol);

  const int scale = plain::RecordScale(extent);
  WorkArray<double> copy;
  const T* xs = x;
  StatusCode s = status::kOk;
  if (scale != 0) {
    copy = plain::ScaledCopy(v, values, scale);
    if (!copy) {
      s = status::kNoMemory;
    } else {
      xs = reinterpret_cast<const T*>(copy.get());
    }
  }
  if (s == status::kOk) {
    call_record::Begin();
    if constexpr (cx) {
      s = StabilizationComplex(xs, n, range, &table);
    } else {
      s = StabilizationReal(xs, n, range, &table);
    }
    const StatusCode absorbed = call_record::End();
    if (s == status::kOk || s == status::kRankDeficient) s = MergeStatus(s, absorbed);
  }
  copy.reset();
  if (s >= 0) {
    // The order search as the face's own MDL runs it (its own scaling and
    // unit power); it leaves its status in the thread's record, which the
    // End below replaces.
    int32_t chosen = 0;
    int32_t searched = 0;
    if constexpr (cx) {
      searched = qdm_mdl_order_complex(reinterpret_cast<const qdm_complex*>(x), n, range.maxOrder,
                                       range.minOrder, &chosen);
    } else {
      searched = qdm_mdl_order_real(x, n, range.maxOrder, range.minOrder, &chosen);
    }
    *mdl = chosen;
    // Public codes are the internal ones but for the argument codes, which
    // cannot occur here.
    s = MergeStatus(s, static_cast<StatusCode>(searched));
  }
  if (s >= 0 && !Screen(&table, scale)) s = static_cast<StatusCode>(QDM_ERR_NON_FINITE_RESULT);
  *rows = table.rows;
  if (s < 0) {
    Clear(&table, mdl);
    *rows = 0;
  }
  return last_error::End(PublicCode(s));
}

}  // namespace

QDM_PLAIN_API int64_t qdm_stabilization_rows(int32_t min_order, int32_t max_order) {
  return StabilizationRows(min_order, max_order);
}

QDM_PLAIN_API int32_t qdm_stabilization_real(const double* x, int32_t n, int32_t pencil,
                                             int32_t min_order, int32_t max_order, double fs,
                                             int32_t real_signal, double freq_tol,
                                             double damping_tol, int64_t room, int32_t* order,
                                             double* frequency, double* damping, double* amplitude,
                                             int32_t* flags, int64_t* rows, int32_t* mdl_order) {
  return Run(x, n,
             {pencil, min_order, max_order, fs, real_signal != 0 ? 1 : 0, freq_tol, damping_tol},
             {order, frequency, damping, amplitude, flags, room, 0}, rows, mdl_order);
}

QDM_PLAIN_API int32_t qdm_stabilization_complex(const qdm_complex* x, int32_t n, int32_t pencil,
                                                int32_t min_order, int32_t max_order, double fs,
                                                double freq_tol, double damping_tol, int64_t room,
                                                int32_t* order, double* frequency, double* damping,
                                                double* amplitude, int32_t* flags, int64_t* rows,
                                                int32_t* mdl_order) {
  return Run(reinterpret_cast<const Complex*>(x), n,
             {pencil, min_order, max_order, fs, 0, freq_tol, damping_tol},
             {order, frequency, damping, amplitude, flags, room, 0}, rows, mdl_order);
}
