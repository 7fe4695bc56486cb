#include "estimation/entry_checks.h"

#include "estimation/estimation.h"
#include "estimation/stabilization.h"

namespace checks {
namespace {

// The sampling-rate test is the ordered comparison 0 >= rate, so a NaN rate
// passes it and reaches the estimator.
bool BadRate(double rate) { return 0.0 >= rate; }

// The largest size with a 32-bit power of two at or above it, 2^30.
constexpr int32_t kLargestSpectrum = int32_t{1} << 30;

// An order or pencil parameter above floor(2n/3), by the bound asked for.
int64_t Bound2n3(int32_t n, Bound bound) {
  return bound == Bound::kHost ? int64_t{MaxOrder(n)} : MaxOrderWide(n);
}

// The refusals: each returns the code it is given and, when asked, says why.
StatusCode Refuse(Failure* why, StatusCode code, const Failure& found) {
  if (why != nullptr) *why = found;
  return code;
}

// "<argument> <value> is below <lowest>", lowest a literal such as "1".
StatusCode Below(Failure* why, StatusCode code, const char* argument, int32_t value,
                 const char* lowest) {
  if (why == nullptr) return code;
  Failure f;
  f.argument = argument;
  f.value = value;
  f.relation = "is below";
  f.limit = lowest;
  return Refuse(why, code, f);
}

// "<argument> <value> <relation> <name> = <limit>", a limit set by another argument.
StatusCode Against(Failure* why, StatusCode code, const char* argument, int32_t value,
                   const char* relation, const char* name, double limit) {
  if (why == nullptr) return code;
  Failure f;
  f.argument = argument;
  f.value = value;
  f.relation = relation;
  f.limit = name;
  f.limitNamed = true;
  f.limitValue = limit;
  return Refuse(why, code, f);
}

// "<argument> <value> is above floor(2n/3) = <bound> (n = <n>)".
StatusCode AboveBound(Failure* why, StatusCode code, const char* argument, int32_t value, int32_t n,
                      Bound bound) {
  if (why == nullptr) return code;
  const StatusCode s = Against(why, code, argument, value, "is above", "floor(2n/3)",
                               static_cast<double>(Bound2n3(n, bound)));
  why->n = n;
  return s;
}

StatusCode NotPositive(Failure* why, StatusCode code, const char* argument, double value) {
  if (why == nullptr) return code;
  Failure f;
  f.argument = argument;
  f.value = value;
  f.relation = "is not positive";
  return Refuse(why, code, f);
}

// Order-like arguments, each checked against its lowest value and floor(2n/3).
StatusCode Size(int32_t value, int32_t lowest, int32_t n, Bound bound, StatusCode code,
                const char* argument, Failure* why) {
  if (value < lowest) return Below(why, code, argument, value, lowest == 0 ? "0" : "1");
  if (value > Bound2n3(n, bound)) return AboveBound(why, code, argument, value, n, bound);
  return status::kOk;
}

StatusCode Samples(int32_t n, Failure* why) {
  return n < 1 ? Below(why, status::kEmptyInput, "n", n, "1") : status::kOk;
}

StatusCode Rate(double rate, Failure* why) {
  return BadRate(rate) ? NotPositive(why, status::kBadSampleRate, "fs", rate) : status::kOk;
}

// A count (components, M) of at least 1 and at most the order it belongs to.
StatusCode Count(int32_t count, const char* argument, int32_t order, const char* orderName,
                 Failure* why) {
  if (count <= 0) return Below(why, status::kBadCount, argument, count, "1");
  if (count > order)
    return Against(why, status::kCountAboveOrder, argument, count, "is above", orderName, order);
  return status::kOk;
}

// m <= 1, or no power of two in 32 bits at or above m.
StatusCode SpectrumSize(int32_t m, Failure* why) {
  if (m <= 1) return Below(why, status::kBadSpectrumSize, "points", m, "2");
  if (SpectrumLength(m) == 0)
    return Against(why, status::kBadSpectrumSize, "points", m, "is above", "2^30",
                   kLargestSpectrum);
  return status::kOk;
}

}  // namespace

StatusCode Prony(int32_t n, int32_t p, double rate, Bound bound, Failure* why) {
  StatusCode s = Samples(n, why);
  if (s == status::kOk) s = Size(p, 1, n, bound, status::kBadCount, "order", why);
  if (s == status::kOk) s = Rate(rate, why);
  return s;
}

StatusCode Covariance(int32_t n, int32_t p, Bound bound, Failure* why) {
  StatusCode s = Samples(n, why);
  if (s == status::kOk) s = Size(p, 1, n, bound, status::kBadCount, "order", why);
  return s;
}

StatusCode Pcar(int32_t n, int32_t p, int32_t components, Bound bound, Failure* why) {
  StatusCode s = Samples(n, why);
  if (s == status::kOk) s = Size(p, 0, n, bound, status::kBadOrder, "order", why);
  if (s == status::kOk) s = Count(components, "components", p, "order", why);
  return s;
}

StatusCode Pencil(int32_t n, int32_t L, int32_t M, double rate, Bound bound, Failure* why) {
  StatusCode s = Samples(n, why);
  if (s == status::kOk) s = Size(L, 0, n, bound, status::kBadOrder, "pencil", why);
  if (s == status::kOk) s = Count(M, "order", L, "pencil", why);
  if (s == status::kOk) s = Rate(rate, why);
  return s;
}

StatusCode Mdl(int32_t n, int32_t L, int32_t minOrder, Bound bound, Failure* why) {
  StatusCode s = Samples(n, why);
  if (s != status::kOk) return s;
  if (minOrder < 1) return Below(why, status::kBadMinOrder, "min_order", minOrder, "1");
  if (L <= minOrder)
    return Against(why, status::kBadMdlUpper, "pencil", L, "is not above", "min_order", minOrder);
  if (L > Bound2n3(n, bound)) return AboveBound(why, status::kBadMdlUpper, "pencil", L, n, bound);
  return status::kOk;
}

// The covariance spectra report a bad order as 12, the PCAR families as 11.
StatusCode CovSpectrum(int32_t n, int32_t p, int32_t m, double rate, Bound bound, Failure* why) {
  StatusCode s = Samples(n, why);
  if (s == status::kOk) s = Size(p, 0, n, bound, status::kBadCount, "order", why);
  if (s == status::kOk) s = SpectrumSize(m, why);
  if (s == status::kOk) s = Rate(rate, why);
  return s;
}

StatusCode PcarSpectrum(int32_t n, int32_t p, int32_t k, int32_t m, double rate, Bound bound,
                        Failure* why) {
  StatusCode s = Samples(n, why);
  if (s == status::kOk) s = Size(p, 0, n, bound, status::kBadOrder, "order", why);
  if (s == status::kOk) s = Count(k, "components", p, "order", why);
  if (s == status::kOk) s = SpectrumSize(m, why);
  if (s == status::kOk) s = Rate(rate, why);
  return s;
}

// ---- error bars of given modes ----
StatusCode ModeErrors(int32_t n, int32_t modes, double rate, Failure* why) {
  StatusCode s = Samples(n, why);
  if (s == status::kOk && modes < 1) s = Below(why, status::kNoModes, "modes", modes, "1");
  if (s == status::kOk) s = Rate(rate, why);
  return s;
}

// ---- the stabilization diagram ----
namespace {

// "<argument> <value> is below 0", a NaN passing.
StatusCode Tolerance(double tol, const char* argument, Failure* why) {
  if (!(0.0 > tol)) return status::kOk;
  if (why == nullptr) return status::kBadTolerance;
  Failure f;
  f.argument = argument;
  f.value = tol;
  f.relation = "is below";
  f.limit = "0";
  return Refuse(why, status::kBadTolerance, f);
}

}  // namespace

StatusCode Stabilization(int32_t n, int32_t L, int32_t minOrder, int32_t maxOrder, double rate,
                         double freqTol, double dampingTol, int64_t room, Bound bound,
                         Failure* why) {
  StatusCode s = Samples(n, why);
  if (s == status::kOk) s = Size(L, 1, n, bound, status::kBadOrder, "pencil", why);
  if (s != status::kOk) return s;
  if (minOrder < 1) return Below(why, status::kBadMinOrder, "min_order", minOrder, "1");
  if (maxOrder <= minOrder)
    return Against(why, status::kBadMdlUpper, "max_order", maxOrder, "is not above", "min_order",
                   minOrder);
  const int32_t r = (n - L) < L ? n - L : L;  // the pencil's most modes
  if (maxOrder > r)
    return Against(why, status::kBadMdlUpper, "max_order", maxOrder, "is above",
                   "min(pencil, n - pencil)", r);
  s = Rate(rate, why);
  if (s == status::kOk) s = Tolerance(freqTol, "freq_tol", why);
  if (s == status::kOk) s = Tolerance(dampingTol, "damping_tol", why);
  if (s != status::kOk) return s;
  const int64_t need = StabilizationRows(minOrder, maxOrder);
  if (room >= need) return status::kOk;
  if (why == nullptr) return status::kTableRoom;
  Failure f;
  f.argument = "room";
  f.value = static_cast<double>(room);
  f.relation = "is below";
  f.limit = "qdm_stabilization_rows(min_order, max_order)";
  f.limitNamed = true;
  f.limitValue = static_cast<double>(need);
  return Refuse(why, status::kTableRoom, f);
}

}  // namespace checks
