// The plain face on records that break naive arithmetic: zero, constant,
// alternating, a single spike, a ramp, denormal values, values near the ends
// of the double range. Every fit either succeeds with finite numbers only or
// fails with its outputs zeroed. A record scaled by a power of two gives the
// unscaled record's results scaled by the same power (amplitudes once,
// variances and errors twice), bit for bit, or the non-finite-result error
// when a scaled result leaves the double range.
#include <gtest/gtest.h>

#include <cfloat>
#include <climits>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <map>

#include "estimation/entry_checks.h"
#include "numeric/work.h"
#include "support/plain_table.h"

namespace {

using namespace qdmtest;

struct Record {
  const char* name;
  double (*value)(int32_t t, int32_t n, double signal);
};

// Real records; the complex twin of each is (v, -v/2), which keeps its kind.
const Record kRecords[] = {
    {"zeros", [](int32_t, int32_t, double) { return 0.0; }},
    {"constant", [](int32_t, int32_t, double) { return 1.0; }},
    {"constant DBL_MIN", [](int32_t, int32_t, double) { return DBL_MIN; }},
    {"alternating", [](int32_t t, int32_t, double) { return t % 2 ? -1.0 : 1.0; }},
    {"alternating DBL_MAX", [](int32_t t, int32_t, double) { return t % 2 ? -DBL_MAX : DBL_MAX; }},
    {"spike first", [](int32_t t, int32_t, double) { return t == 0 ? 1.0 : 0.0; }},
    {"spike middle", [](int32_t t, int32_t n, double) { return t == n / 2 ? 1.0 : 0.0; }},
    {"spike last", [](int32_t t, int32_t n, double) { return t == n - 1 ? 1.0 : 0.0; }},
    {"ramp", [](int32_t t, int32_t, double) { return double(t); }},
    {"ramp 1e300", [](int32_t t, int32_t, double) { return 1e300 * t; }},
    {"steps of the least denormal", [](int32_t t, int32_t, double) { return 0x1p-1074 * (t % 3); }},
    {"signal denormal", [](int32_t, int32_t, double v) { return std::ldexp(v, -1060); }},
    {"signal x DBL_MIN", [](int32_t, int32_t, double v) { return v * DBL_MIN; }},
    {"signal x 1e-300", [](int32_t, int32_t, double v) { return v * 1e-300; }},
    {"signal x 1e-165", [](int32_t, int32_t, double v) { return v * 1e-165; }},
    {"signal x 1e155", [](int32_t, int32_t, double v) { return v * 1e155; }},
    {"signal x 1e160", [](int32_t, int32_t, double v) { return v * 1e160; }},
    {"signal x 1e300", [](int32_t, int32_t, double v) { return v * 1e300; }},
    {"signal", [](int32_t, int32_t, double v) { return v; }},
};

std::vector<double> Make(const Record& r, bool cx, int32_t n) {
  const std::vector<double> signal = Samples(false, n);
  std::vector<double> v;
  for (int32_t t = 0; t < n; ++t) {
    const double value = r.value(t, n, signal[size_t(t)]);
    v.push_back(value);
    if (cx) v.push_back(-0.5 * value);
  }
  return v;
}

// The argument sets of the shared table and the longer one on 256 samples;
// spectra the plain face refuses as too short are left out.
std::vector<Scalars> Sets(const Export& x) {
  std::vector<Scalars> sets;
  for (Scalars s : ArgumentSets(x.family)) {
    if (!SpectrumTooShort(x, s)) sets.push_back(s);
  }
  Scalars longer = sets.back();
  longer.n = 256;
  sets.push_back(longer);
  return sets;
}

bool Known(int32_t st) {
  switch (st) {
#define QDM_KNOWN(name, code, text) case code:
    QDM_STATUS_TABLE(QDM_KNOWN)
#undef QDM_KNOWN
    return true;
  }
  return false;
}

TEST(PlainRecords, NoSuccessCarriesANonFiniteValue) {
  int64_t calls = 0, successes = 0;
  std::map<int32_t, int64_t> errors;
  for (const Export& x : Exports()) {
    for (const Scalars& s : Sets(x)) {
      for (const Record& r : kRecords) {
        const std::string where = Where(x, s) + " " + r.name;
        const std::vector<double> data = Make(r, x.complexData, s.n);
        PlainCall p;
        const int32_t st = CallPlain(x, data.data(), s, p);
        ++calls;
        EXPECT_TRUE(Known(st)) << where << ": status " << st;
        if (st >= 0) {
          ++successes;
          EXPECT_TRUE(AllFinite(x, p)) << where << ": status " << st;
        } else {
          ++errors[st];
          // Every argument is valid: a failure comes from inside the fit.
          EXPECT_GT(st, -42400) << where;
          EXPECT_TRUE(Zeroed(x, p)) << where << ": status " << st;
        }
        EXPECT_EQ(NumAllocOutstanding(), 0) << where;
      }
    }
  }
  std::printf("pathological records: %lld plain calls, %lld successes, all finite; errors:",
              static_cast<long long>(calls), static_cast<long long>(successes));
  for (const auto& [code, count] : errors) std::printf(" %d x%lld", code, (long long)count);
  std::printf("\n");
  RecordProperty("calls", static_cast<int>(calls));
  RecordProperty("successes", static_cast<int>(successes));
}

// How output i (or out double i) follows the record's scale: 1 for amplitudes,
// 2 for variances and errors, 0 for the rest.
int Power(const Export& x, bool outDouble, int i) {
  switch (x.family) {
    case Family::kProny:
      return !outDouble && i == 0 ? 1 : 0;
    case Family::kPencil:
      return outDouble ? 2 : i == 0 ? 1 : 0;
    case Family::kCovariance:
      return outDouble ? 2 : 0;
    case Family::kCovSpectrum:
      return outDouble && i == 2 ? 2 : 0;
    case Family::kPcarSpectrum:
      return outDouble ? (i == 2 ? 2 : 0) : i == 0 ? 1 : 0;
    default:
      return 0;
  }
}

bool SameBits(double a, double b) { return std::memcmp(&a, &b, sizeof a) == 0; }

// Records far outside [2^-128, 2^128] are fitted as a scaled copy; within it
// the estimators see the caller's samples. Either way the results follow the
// scale exactly, because every fit is homogeneous in the record and a
// power-of-two factor rounds nothing.
TEST(PlainRecords, ScaledRecordsGiveScaledResults) {
  int compared = 0, overflowed = 0;
  for (const Export& x : Exports()) {
    for (const Scalars& s : Sets(x)) {
      const std::vector<double> base = Samples(x.complexData, s.n);
      PlainCall ref;
      const int32_t refStatus = CallPlain(x, base.data(), s, ref);
      ASSERT_GE(refStatus, 0) << Where(x, s);
      for (int k : {-1000, -900, -548, -129, 129, 300, 515, 900}) {
        const std::string where = Where(x, s) + " x 2^" + std::to_string(k);
        std::vector<double> scaled = base;
        for (double& v : scaled) v = std::ldexp(v, k);
        PlainCall p;
        const int32_t st = CallPlain(x, scaled.data(), s, p);
        bool fits = true;  // every scaled result inside the double range
        for (int i = 0; i < x.outputs; ++i)
          for (size_t j = 0; j < ResultValues(x, ref, i); ++j)
            fits = fits && std::isfinite(std::ldexp(ref.out[i][j], k * Power(x, false, i)));
        for (int j = 0; j < x.doubles; ++j)
          fits = fits && std::isfinite(std::ldexp(ref.d[j], k * Power(x, true, j)));
        if (!fits) {
          EXPECT_EQ(st, QDM_ERR_NON_FINITE_RESULT) << where;
          EXPECT_TRUE(Zeroed(x, p)) << where;
          ++overflowed;
          continue;
        }
        ASSERT_EQ(st, refStatus) << where;
        EXPECT_EQ(p.count, ref.count) << where;
        for (int i = 0; i < x.outputs; ++i)
          for (size_t j = 0; j < ResultValues(x, ref, i); ++j)
            EXPECT_TRUE(SameBits(p.out[i][j], std::ldexp(ref.out[i][j], k * Power(x, false, i))))
                << where << " out" << i << "[" << j << "] " << p.out[i][j] << " vs "
                << ref.out[i][j];
        for (int j = 0; j < x.doubles; ++j)
          EXPECT_TRUE(SameBits(p.d[j], std::ldexp(ref.d[j], k * Power(x, true, j))))
              << where << " d" << j << " " << p.d[j] << " vs " << ref.d[j];
        ++compared;
      }
    }
  }
  std::printf("scaled records: %d compared bit for bit, %d refused as out of range\n", compared,
              overflowed);
  EXPECT_GT(overflowed, 0);
}

// The order bound is floor(2n/3) in 64 bits on this face: a record of 2^30 or
// more samples passes the order check and is refused by the work bound, before
// a sample is read (x points to 4 doubles here) or memory allocated.
TEST(PlainRecords, HugeRecordsMeetTheWorkBound) {
  double x[4] = {1, 2, 3, 4};
  for (int32_t n : {1 << 30, (1 << 30) + 1, INT_MAX}) {
    for (const Export& e : Exports()) {
      Scalars s = ArgumentSets(e.family).back();
      s.n = n;
      NumAllocFailAt(1, true);
      PlainCall p;
      EXPECT_EQ(CallPlain(e, x, s, p), QDM_ERR_WORK_LIMIT) << Where(e, s);
      NumAllocFailAt(0, false);
    }
    // The host face keeps its 32-bit bound, negative from 2^30 on.
    EXPECT_EQ(checks::Covariance(n, 4), status::kBadCount) << n;
    EXPECT_EQ(checks::Covariance(n, 4, checks::Bound::kWide), status::kOk) << n;
  }
}

}  // namespace
