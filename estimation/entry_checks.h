// The argument checks of the fourteen fits, shared by every face of the
// library: the host exports and the plain C API run exactly these, in this
// order, before they size anything. Each returns the code of the first check
// that fails (the estimators' argument codes of core/types.h), or 0. No size
// is computed from an argument before it has passed its check.
//
// The order bound is the host's 32-bit floor(2n/3) unless the caller asks for
// the wide one (the plain C API does; see MaxOrderWide in core/types.h).
#pragma once

#include <cstdint>

#include "core/types.h"

namespace checks {

enum class Bound { kHost, kWide };

StatusCode Prony(int32_t n, int32_t p, double rate, Bound bound = Bound::kHost);
StatusCode Covariance(int32_t n, int32_t p, Bound bound = Bound::kHost);
StatusCode Pcar(int32_t n, int32_t p, int32_t components, Bound bound = Bound::kHost);
StatusCode Pencil(int32_t n, int32_t L, int32_t M, double rate, Bound bound = Bound::kHost);
// The MDL codes 1, 14 and 15 reach the host as -42401, -42414 and -42415.
StatusCode Mdl(int32_t n, int32_t L, int32_t minOrder, Bound bound = Bound::kHost);
// m above 2^30 has no 32-bit power of two above it and fails like m < 2.
StatusCode CovSpectrum(int32_t n, int32_t p, int32_t m, double rate, Bound bound = Bound::kHost);
StatusCode PcarSpectrum(int32_t n, int32_t p, int32_t k, int32_t m, double rate,
                        Bound bound = Bound::kHost);

// ---- error bars of given modes ----
// The standard errors of `modes` modes on n samples at sampling rate `rate`.
StatusCode ModeErrors(int32_t n, int32_t modes, double rate);

}  // namespace checks
