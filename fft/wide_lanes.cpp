#include "fft/wide_lanes.h"

#include <atomic>

#include "fft/kernel_access.h"

namespace fftk {
namespace {

bool Detect() {
#if FFTK_WIDE
  __builtin_cpu_init();  // may run before libgcc's own constructor
  return __builtin_cpu_supports("avx") != 0;
#else
  return false;
#endif
}

// Relaxed: the flag only selects between two variants with identical results.
std::atomic<bool> gWide{Detect()};

}  // namespace

bool WideLanes() { return gWide.load(std::memory_order_relaxed); }

void SetWideLanes(bool on) { gWide.store(on && Detect(), std::memory_order_relaxed); }

}  // namespace fftk
