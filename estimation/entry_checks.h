// The argument checks of the fourteen fits, shared by every face of the
// library: the host exports and the plain C API run exactly these, in this
// order, before they size anything. Each returns the code of the first check
// that fails (the estimators' argument codes of core/types.h), or 0. No size
// is computed from an argument before it has passed its check.
//
// The order bound is the host's 32-bit floor(2n/3) unless the caller asks for
// the wide one (the plain C API does; see MaxOrderWide in core/types.h).
//
// A caller that explains its refusals passes a Failure: the check that fails
// fills it with the argument, its value and the limit it broke. The host face
// passes none and gets the code alone; the checks are the same either way.
#pragma once

#include <cstdint>

#include "core/types.h"

namespace checks {

enum class Bound { kHost, kWide };

// What one failed check found, read as
//   "<argument> <value> <relation> <limit>[ = <limitValue>][ (n = <n>)]",
// e.g. "order 300 is above floor(2n/3) = 206 (n = 309)" or "fs -1 is not
// positive". Arguments are named as the plain C API's header names them
// (the pencil's M is `order` there). Every text is a static string.
struct Failure {
  const char* argument = nullptr;  // null: no check has failed
  double value = 0.0;              // every int32 is exact in a double
  bool hasValue = true;            // false: "x is null"
  const char* relation = nullptr;  // "is below", "is above", "is not positive", ...
  const char* limit = nullptr;     // "1", "floor(2n/3)", "order", or null
  bool limitNamed = false;         // limit is a name: " = <limitValue>" follows
  double limitValue = 0.0;
  int32_t n = -1;              // the record length the limit depends on, or -1
  const char* unit = nullptr;  // after the value, e.g. " bytes", or null
};

StatusCode Prony(int32_t n, int32_t p, double rate, Bound bound = Bound::kHost,
                 Failure* why = nullptr);
StatusCode Covariance(int32_t n, int32_t p, Bound bound = Bound::kHost, Failure* why = nullptr);
StatusCode Pcar(int32_t n, int32_t p, int32_t components, Bound bound = Bound::kHost,
                Failure* why = nullptr);
StatusCode Pencil(int32_t n, int32_t L, int32_t M, double rate, Bound bound = Bound::kHost,
                  Failure* why = nullptr);
// The MDL codes 1, 14 and 15 reach the host as -42401, -42414 and -42415.
StatusCode Mdl(int32_t n, int32_t L, int32_t minOrder, Bound bound = Bound::kHost,
               Failure* why = nullptr);
// m above 2^30 has no 32-bit power of two above it and fails like m < 2. An
// order of 0 passes; the covariance spectrum refuses it later (kBadCount),
// once the outputs are sized, as its fit would.
StatusCode CovSpectrum(int32_t n, int32_t p, int32_t m, double rate, Bound bound = Bound::kHost,
                       Failure* why = nullptr);
StatusCode PcarSpectrum(int32_t n, int32_t p, int32_t k, int32_t m, double rate,
                        Bound bound = Bound::kHost, Failure* why = nullptr);

// ---- error bars of given modes ----
// The standard errors of `modes` modes on n samples at sampling rate `rate`.
StatusCode ModeErrors(int32_t n, int32_t modes, double rate, Failure* why = nullptr);

// ---- the stabilization diagram ----
// Orders min_order..max_order of pencils with parameter L: 1 <= L <= floor(2n/3),
// 1 <= min_order < max_order <= min(L, n - L), tolerances >= 0 (a NaN passes
// here; the face refuses it as not finite), and a table of at least
// StabilizationRows(min_order, max_order) rows.
StatusCode Stabilization(int32_t n, int32_t L, int32_t minOrder, int32_t maxOrder, double rate,
                         double freqTol, double dampingTol, int64_t room,
                         Bound bound = Bound::kHost, Failure* why = nullptr);

}  // namespace checks
