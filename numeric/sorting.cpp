// Sorting a real vector with NaN values first, and the NaN-skipping extremes.

#include <algorithm>
#include <cmath>
#include <cstring>
#include <functional>
#include <limits>

#include "numeric/numeric.h"

StatusCode SortReal(double* x, int32_t n, int32_t descending, double* out) {
  if (n < 1) return status::kBadSize;
  double* v = x;
  if (out != nullptr) {
    if (out != x) std::memcpy(out, x, static_cast<size_t>(n) * sizeof(double));
    v = out;
  }
  if (n == 1) return status::kOk;

  // One pass gathers the NaN values at the front: every NaN found behind the
  // front block changes places with the first non-NaN value after the block.
  ptrdiff_t front = 0;
  const ptrdiff_t count = n;
  for (ptrdiff_t i = 0; i < count; ++i) {
    if (std::isnan(v[i])) {
      if (i != front) std::swap(v[front], v[i]);
      ++front;
    }
  }
  if (front == count) return status::kOk;

  // The numbers behind the NaN block. std::sort is an introsort (median-of-three
  // quicksort, insertion sort for short ranges, heap sort past a depth limit)
  // that works in place and never allocates; equal values may end in any order.
  double* tail = v + front;
  if (descending != 0) {
    std::sort(tail, v + count, std::greater<double>());
  } else {
    std::sort(tail, v + count);
  }
  return status::kOk;
}

StatusCode MinMaxReal(const double* x, int32_t n, double* maxValue, int32_t* maxIndex,
                      double* minValue, int32_t* minIndex) {
  if (n < 1) return status::kBadSize;
  int32_t first = 0;
  while (first < n && std::isnan(x[first])) ++first;
  if (first == n) {
    *maxValue = std::numeric_limits<double>::quiet_NaN();
    *minValue = std::numeric_limits<double>::quiet_NaN();
    *maxIndex = -1;
    *minIndex = -1;
    return status::kOk;
  }
  double hi = x[first];
  double lo = x[first];
  int32_t hi_at = first;
  int32_t lo_at = first;
  for (int32_t i = first + 1; i < n; ++i) {
    const double value = x[i];
    if (std::isnan(value)) continue;
    // Strict comparisons: a tie keeps the earlier index.
    if (value > hi) {
      hi = value;
      hi_at = i;
    } else if (value < lo) {
      lo = value;
      lo_at = i;
    }
  }
  *maxValue = hi;
  *maxIndex = hi_at;
  *minValue = lo;
  *minIndex = lo_at;
  return status::kOk;
}
