#include "estimation/stabilization.h"

#include <cassert>
#include <cmath>
#include <cstddef>
#include <cstring>
#include <utility>

#include "core/scalar.h"
#include "estimation/estimation.h"
#include "estimation/estimators.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

// One order's modes, as ModeParameters reports them.
struct Modes {
  double* amp;
  double* phase;
  double* damp;
  double* freq;
  int32_t count = 0;
};

// True when |a - b| <= tol * max(|a|, floor).
bool Near(double a, double b, double tol, double floor) {
  return std::fabs(a - b) <= tol * std::fmax(std::fabs(a), floor);
}

template <typename T>
StatusCode Stabilization(const T* x, int32_t n, const StabilizationRange& range,
                         StabilizationTable* table) {
  const int32_t top = range.maxOrder;
  assert(range.minOrder >= 1 && range.minOrder < top && top <= range.L && top <= n - range.L);
  assert(table->room >= StabilizationRows(range.minOrder, top));
  const size_t mm = static_cast<size_t>(top);
  auto K = AllocWorkUninit<T>(mm * mm);
  auto block = AllocWorkUninit<T>(mm * mm);
  auto poles = AllocWorkUninit<Complex>(mm);
  auto amplitudes = AllocWork<Complex>(mm);
  auto modeWork = AllocWorkUninit<double>(8 * mm);
  if (!K || !block || !poles || !amplitudes || !modeWork) return status::kNoMemory;
  double* w = modeWork.get();
  Modes now{w, w + mm, w + 2 * mm, w + 3 * mm};
  Modes below{w + 4 * mm, w + 5 * mm, w + 6 * mm, w + 7 * mm};

  // The max_order pencil; each order's pencil is its leading block.
  StatusCode st = PencilMatrix(x, n, range.L, top, K.get());
  if (st != status::kOk) return st;

  const double floorF = range.fs / static_cast<double>(n);
  const double floorD = 1.0 / static_cast<double>(n);
  table->rows = 0;
  // The order below min_order is fitted for the comparison only (no amplitudes).
  for (int32_t m = range.minOrder > 1 ? range.minOrder - 1 : 1; m <= top; ++m) {
    const size_t ms = static_cast<size_t>(m);
    for (size_t i = 0; i < ms; ++i) {
      std::memcpy(static_cast<void*>(block.get() + i * ms), K.get() + i * mm, ms * sizeof(T));
    }
    st = EigGeneral(block.get(), m, 0, poles.get(), static_cast<Complex*>(nullptr));
    if (st != status::kOk) return st;
    const bool listed = m >= range.minOrder;
    if (listed) {
      double mse = 0.0;
      st = ModeAmplitudes(x, n, poles.get(), m, amplitudes.get(), &mse);
      if (st != status::kOk) return st;
    }
    st = ModeParameters(amplitudes.get(), m, poles.get(), m, range.fs, range.realFlag, now.amp,
                        now.phase, now.damp, now.freq, &now.count);
    if (st != status::kOk) return st;
    if (listed) {
      const bool compared = m > 1;  // order 0 has no poles to match
      for (int32_t i = 0; i < now.count; ++i) {
        const int64_t row = table->rows++;
        int32_t flags = 0;
        for (int32_t j = 0; compared && j < below.count; ++j) {
          const bool f = Near(now.freq[i], below.freq[j], range.freqTol, floorF);
          const bool d = Near(now.damp[i], below.damp[j], range.dampingTol, floorD);
          flags |= (f ? kStableFrequency : 0) | (d ? kStableDamping : 0) | (f && d ? kStable : 0);
        }
        table->order[row] = m;
        table->frequency[row] = now.freq[i];
        table->damping[row] = now.damp[i];
        table->amplitude[row] = now.amp[i];
        table->flags[row] = flags;
      }
    }
    std::swap(now, below);
  }
  return status::kOk;
}

}  // namespace

int64_t StabilizationRows(int32_t minOrder, int32_t maxOrder) {
  if (minOrder < 1 || maxOrder < minOrder) return 0;
  const int64_t lo = minOrder, hi = maxOrder;
  return (hi - lo + 1) * (lo + hi) / 2;
}

StatusCode StabilizationReal(const double* x, int32_t n, const StabilizationRange& range,
                             StabilizationTable* table) {
  return Stabilization<double>(x, n, range, table);
}
// Complex data have no conjugate pairs to fold: every pole is listed.
StatusCode StabilizationComplex(const Complex* x, int32_t n, const StabilizationRange& range,
                                StabilizationTable* table) {
  StabilizationRange all = range;
  all.realFlag = 0;
  return Stabilization<Complex>(x, n, all, table);
}
