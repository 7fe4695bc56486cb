#include "estimation/entry_checks.h"

#include "estimation/estimation.h"

namespace checks {
namespace {

// The sampling-rate test is the ordered comparison 0 >= rate, so a NaN rate
// passes it and reaches the estimator.
bool BadRate(double rate) { return 0.0 >= rate; }

// m <= 1, or no power of two in 32 bits at or above m.
bool BadSpectrumSize(int32_t m) { return m <= 1 || SpectrumLength(m) == 0; }

// An order or pencil parameter above floor(2n/3), by the bound asked for.
bool Above(int32_t p, int32_t n, Bound bound) {
  return bound == Bound::kHost ? p > MaxOrder(n) : p > MaxOrderWide(n);
}

}  // namespace

StatusCode Prony(int32_t n, int32_t p, double rate, Bound bound) {
  if (n < 1) return status::kEmptyInput;
  if (p <= 0 || Above(p, n, bound)) return status::kBadCount;
  if (BadRate(rate)) return status::kBadSampleRate;
  return status::kOk;
}

StatusCode Covariance(int32_t n, int32_t p, Bound bound) {
  if (n < 1) return status::kEmptyInput;
  if (p <= 0 || Above(p, n, bound)) return status::kBadCount;
  return status::kOk;
}

StatusCode Pcar(int32_t n, int32_t p, int32_t components, Bound bound) {
  if (n < 1) return status::kEmptyInput;
  if (p < 0 || Above(p, n, bound)) return status::kBadOrder;
  if (components <= 0) return status::kBadCount;
  if (components > p) return status::kCountAboveOrder;
  return status::kOk;
}

StatusCode Pencil(int32_t n, int32_t L, int32_t M, double rate, Bound bound) {
  if (n < 1) return status::kEmptyInput;
  if (L < 0 || Above(L, n, bound)) return status::kBadOrder;
  if (M <= 0) return status::kBadCount;
  if (M > L) return status::kCountAboveOrder;
  if (BadRate(rate)) return status::kBadSampleRate;
  return status::kOk;
}

StatusCode Mdl(int32_t n, int32_t L, int32_t minOrder, Bound bound) {
  if (n < 1) return status::kEmptyInput;
  if (minOrder < 1) return status::kBadMinOrder;
  if (L <= minOrder || Above(L, n, bound)) return status::kBadMdlUpper;
  return status::kOk;
}

// The covariance spectra report a bad order as 12, the PCAR families as 11.
StatusCode CovSpectrum(int32_t n, int32_t p, int32_t m, double rate, Bound bound) {
  if (n < 1) return status::kEmptyInput;
  if (p < 0 || Above(p, n, bound)) return status::kBadCount;
  if (BadSpectrumSize(m)) return status::kBadSpectrumSize;
  if (BadRate(rate)) return status::kBadSampleRate;
  return status::kOk;
}

StatusCode PcarSpectrum(int32_t n, int32_t p, int32_t k, int32_t m, double rate, Bound bound) {
  if (n < 1) return status::kEmptyInput;
  if (p < 0 || Above(p, n, bound)) return status::kBadOrder;
  if (k <= 0) return status::kBadCount;
  if (k > p) return status::kCountAboveOrder;
  if (BadSpectrumSize(m)) return status::kBadSpectrumSize;
  if (BadRate(rate)) return status::kBadSampleRate;
  return status::kOk;
}

// ---- error bars of given modes ----
StatusCode ModeErrors(int32_t n, int32_t modes, double rate) {
  if (n < 1) return status::kEmptyInput;
  if (modes < 1) return status::kNoModes;
  if (BadRate(rate)) return status::kBadSampleRate;
  return status::kOk;
}

}  // namespace checks
