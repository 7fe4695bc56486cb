// Basic types shared by every layer of the library: the status code that every
// internal routine returns, its values, and the complex element type.
#pragma once

#include <complex>
#include <cstdint>

// The status every internal routine returns. An enumeration over int32_t, so
// that it reads and compares as the integer it is, but [[nodiscard]]: every
// call whose status is dropped without a (void) is a compile-time warning.
enum [[nodiscard]] StatusCode : int32_t{};
using Complex = std::complex<double>;  // same layout as two doubles, real part first

// Status values. 0 is success; small positive values are estimator argument
// errors (mapped by the entry points to -42400 - code); 20001 is the
// rank-deficiency warning; negative values are numeric and FFT failures that
// reach the host unchanged.
namespace status {
constexpr StatusCode kOk{0};

// estimator argument errors
constexpr StatusCode kEmptyInput{1};        // n < 1
constexpr StatusCode kBadOrder{11};         // order / pencil parameter out of range
constexpr StatusCode kBadCount{12};         // order <= 0 (some families), components / k / M <= 0
constexpr StatusCode kCountAboveOrder{13};  // components / k / M above the order or L
constexpr StatusCode kBadMinOrder{14};      // MDL minOrder < 1
constexpr StatusCode kBadMdlUpper{15};      // MDL L not above minOrder, or above floor(2n/3)
constexpr StatusCode kNoModes{16};          // amplitude fit asked for no modes
constexpr StatusCode kBadSpectrumSize{17};  // spectrum size m < 2
constexpr StatusCode kBadSampleRate{18};    // sampling rate not positive

// numeric library
constexpr StatusCode kRankDeficient{20001};  // warning: rank < min(rows, cols)
constexpr StatusCode kNoMemory{-20001};
constexpr StatusCode kBadSize{-20003};              // a size argument below 1
constexpr StatusCode kNegativeDim{-20004};          // negative matrix-product dimension
constexpr StatusCode kBadOption{-20061};            // option argument out of range
constexpr StatusCode kNoConvergence{-20062};        // LAPACK INFO > 0, root iteration limit
constexpr StatusCode kBadPolynomial{-20063};        // NaN coefficient or degree < 1
constexpr StatusCode kNonFinite{-20068};            // rejected by HasNonFinite*
constexpr StatusCode kRootNaN{-20116};              // root iteration produced NaN
constexpr StatusCode kKrylovNoConvergence{-20070};  // Lanczos restarts exhausted
constexpr StatusCode kIllegalArgument{-20999};      // LAPACK INFO < 0; real FFT length mismatch

// FFT engine
constexpr StatusCode kFftLengthMismatch{-1};          // complex driver
constexpr StatusCode kFftRealLengthMismatch{-20999};  // real driver
}  // namespace status

// Folds a later status into a running one at clean-up: success is replaced by
// anything, a warning only by an error, an error is kept.
constexpr StatusCode MergeStatus(StatusCode running, StatusCode later) {
  if (running == 0) return later;
  if (running > 0 && later < 0) return later;
  return running;
}

// The order bound floor(2n/3) used by every order check, in 32-bit signed
// arithmetic as the host computes it.
constexpr int32_t MaxOrder(int32_t n) {
  return static_cast<int32_t>(static_cast<uint32_t>(n) * 2u) / 3;
}

// The same bound without the wrap, for the plain C API. The host's 32-bit form
// turns negative for n >= 2^30, so the host face refuses every order there;
// the plain face takes floor(2n/3) as it is and lets its work-memory bound
// refuse such a record instead. The two agree for every n below 2^30.
constexpr int64_t MaxOrderWide(int32_t n) { return int64_t{n} * 2 / 3; }
