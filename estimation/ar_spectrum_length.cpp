// Length of the spectrum grid for a requested number of points.
#include <cstdint>

#include "estimation/estimation.h"

int32_t IntLog2(int32_t x) {
  if (x <= 0) return -1;
  int32_t e = 0;
  // Counted by doubling from 1; 64-bit so the last doubling cannot overflow.
  for (int64_t power = 2; power <= x; power *= 2) ++e;
  return e;
}

// 2^IntLog2(2m - 1): the smallest power of two not below m. 0 when there is
// none in 32 bits (m > 2^30) or m < 1.
int32_t SpectrumLength(int32_t m) {
  if (m < 1 || m > (INT32_C(1) << 30)) return 0;
  // 2m - 1 >= 1 here, so IntLog2 takes its non-negative branch; the analyzer
  // does not follow the bound into it.
  // NOLINTNEXTLINE(clang-analyzer-core.UndefinedBinaryOperatorResult)
  return INT32_C(1) << IntLog2(static_cast<int32_t>(2 * static_cast<int64_t>(m) - 1));
}
