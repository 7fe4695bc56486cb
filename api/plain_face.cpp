#include "api/plain_face.h"

#include <algorithm>

namespace plain {
namespace {

// Folds one sample into a running largest magnitude; a NaN or an infinity
// makes it infinite for good.
inline void FoldMagnitude(double v, double& largest) {
  const double a = std::fabs(v);
  largest = a > largest ? a : largest;
  if (!(a <= DBL_MAX)) largest = HUGE_VAL;
}

}  // namespace

double Extent(const double* v, int64_t values) {
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

int RecordScale(double largest) {
  constexpr double kHigh = 0x1p128, kLow = 0x1p-128;
  if (largest == 0.0 || (largest >= kLow && largest <= kHigh)) return 0;
  return -std::ilogb(largest);
}

WorkArray<double> ScaledCopy(const double* v, size_t values, int scale) {
  WorkArray<double> copy = AllocWorkUninit<double>(values);
  for (size_t i = 0; copy && i < values; ++i) copy[i] = std::ldexp(v[i], scale);
  return copy;
}

namespace {
thread_local bool g_admitting = false;
}

bool Admitting() { return g_admitting; }
Admission::Admission() { g_admitting = true; }
Admission::~Admission() { g_admitting = false; }

}  // namespace plain
