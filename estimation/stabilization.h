// The stabilization diagram: the modes of pencil fits of every order from
// min_order to max_order, taken from one reduced pencil matrix (the leading
// m x m block of the max_order pencil is the m-mode pencil), each pole
// flagged by whether a pole of the order below matches it.
//
// A pole of order m matches one of order m - 1 in frequency when
//   |f - f'| <= freq_tol * max(|f|, fs / n)
// and in damping (ln|z| per sample) when
//   |d - d'| <= damping_tol * max(|d|, 1 / n),
// f and d the order-m pole's own. The floors fs/n (the record's frequency
// resolution) and 1/n (a decay of e over the record) keep a tolerance
// relative to a value near 0 from shrinking to nothing.
#pragma once

#include <cstdint>

#include "core/types.h"

namespace status {
// The plain face's argument codes of the diagram (-42426, -42427 there).
constexpr StatusCode kBadTolerance{26};  // a tolerance below 0
constexpr StatusCode kTableRoom{27};     // the caller's table has too few rows
}  // namespace status

// Row flags.
constexpr int32_t kStableFrequency = 1;  // some pole of the order below matches in frequency
constexpr int32_t kStableDamping = 2;    // some pole of the order below matches in damping
constexpr int32_t kStable = 4;           // one pole of the order below matches in both

// The caller's table: `room` rows of each column; `rows` receives the rows
// written, order by order, each order's poles in the eigensolver's order.
struct StabilizationTable {
  int32_t* order;
  double* frequency;  // Hz
  double* damping;    // ln|z| per sample
  double* amplitude;  // |A|, least squares against the record
  int32_t* flags;
  int64_t room;
  int64_t rows;
};

struct StabilizationRange {
  int32_t L;  // pencil parameter
  int32_t minOrder;
  int32_t maxOrder;  // <= min(L, n - L)
  double fs;
  int32_t realFlag;  // real data: one mode per conjugate pair
  double freqTol;
  double dampingTol;
};

// Rows the table may need: the sum of m over min_order..max_order (real_signal
// writes fewer); 0 when max_order < min_order or min_order < 1.
int64_t StabilizationRows(int32_t minOrder, int32_t maxOrder);

// Statuses: kNoMemory and the LAPACK failures of the decomposition and the
// eigensolver.
[[nodiscard]] StatusCode StabilizationReal(const double* x, int32_t n,
                                           const StabilizationRange& range,
                                           StabilizationTable* table);
[[nodiscard]] StatusCode StabilizationComplex(const Complex* x, int32_t n,
                                              const StabilizationRange& range,
                                              StabilizationTable* table);
