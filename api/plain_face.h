// What every source of the plain face shares: the public numbering of the
// internal statuses, the finiteness screen and the power-of-two scaling of
// extreme records. Written once here so that the fits, the spectrum layout and
// the mode errors number, screen and scale alike.
#pragma once

#include <cfloat>
#include <cmath>
#include <cstdint>

#include "core/types.h"
#include "numeric/work.h"

namespace plain {

// The host's mapping of an estimator's argument code c to -42400 - c; the
// warnings (positive above 20000) and the numeric codes pass unchanged.
constexpr int32_t PublicCode(StatusCode s) {
  return (s > 0 && s < status::kRankDeficient) ? -42400 - s : s;
}

inline bool Finite(double v) { return std::fabs(v) <= DBL_MAX; }

// The largest magnitude among `values` doubles, or -1 when one is NaN or
// infinite. Four independent lanes and no early exit keep the scan about as
// fast as a plain finiteness test.
double Extent(const double* v, int64_t values);

// The power of two a record is multiplied by before the fit: 0 inside
// [2^-128, 2^128], where the fits' squares and sums cannot overflow or lose
// bits to underflow and the estimators see the caller's samples unchanged;
// outside it, the exponent that brings the largest magnitude into [1, 2).
// Multiplying by a power of two is exact (but for samples that fall below
// 2^-1022 beside a much larger maximum, far under its rounding), every fit is
// homogeneous in the record, and the results are scaled back exactly.
int RecordScale(double largest);

// A work block holding `values` doubles of v times 2^scale; empty when memory
// ran out.
WorkArray<double> ScaledCopy(const double* v, size_t values, int scale);

// A batch asks its calls' argument checks once, before any record: while an
// Admission lives on a thread, a call of this face on that thread makes its
// checks of the arguments (sizes, pointers, the work bound, fs) and returns
// QDM_OK when they pass, before it reads a sample or writes anything.
bool Admitting();

class Admission {
 public:
  Admission();
  ~Admission();
  Admission(const Admission&) = delete;
  Admission& operator=(const Admission&) = delete;
};

}  // namespace plain
