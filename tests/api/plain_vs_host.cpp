// The plain C API against the host face, on the same inputs: the same numbers
// and the same codes across valid calls and argument walks, plus what the
// plain face adds (non-finite input, null pointers, the work-memory bound) and
// its rule that no failure inside a fit is reported as success, checked by
// failing each work allocation in turn.
//
// The plain face runs in this process (linked from the same core objects, so
// the allocation hook is reachable); the host face is the built libqdm,
// loaded as the host loads it.
#include <gtest/gtest.h>

#include <climits>
#include <cstdio>
#include <cmath>
#include <cstring>
#include <functional>
#include <limits>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "numeric/lapack_boundary.h"
#include "numeric/work.h"
#include "qdm_api.h"
#include "support/export_table.h"
#include "support/plain_table.h"

namespace {

using namespace qdmtest;

// Doubles of the data the host block holds.
std::vector<double> Samples(bool complexData, int32_t n) {
  const HostArray h = Signal(complexData, n);
  if (!complexData) return h.Reals();
  std::vector<double> out;
  for (auto z : h.Complexes()) out.insert(out.end(), {z.real(), z.imag()});
  return out;
}

// A larger valid call per family, beside Valid(): n = 64.
Scalars Larger(Family f) {
  switch (f) {
    case Family::kProny: return {64, 6, 0, 0, 1000.0};
    case Family::kCovariance: return {64, 15, 0, 0, 1.0};
    case Family::kPcar: return {64, 12, 4, 0, 1.0};
    case Family::kPencil: return {64, 21, 4, 0, 250.0};
    case Family::kMdl: return {64, 20, 1, 0, 1.0};
    case Family::kCovSpectrum: return {64, 12, 100, 0, 2.0};
    case Family::kPcarSpectrum: return {64, 12, 300, 4, 2.0};
  }
  return {};
}

// Host outputs and plain outputs agree bit for bit.
void ExpectSameResults(const Export& x, const Call& host, const PlainCall& plain,
                       const std::string& where) {
  for (int i = 0; i < x.outputs; ++i) {
    const bool complexOut = (x.family == Family::kCovariance || x.family == Family::kPcar) &&
                            (i == 0 || x.complexData);
    const int32_t count = host.out[i].Count();
    std::vector<double> h = complexOut ? std::vector<double>() : host.out[i].Reals();
    if (complexOut) {
      for (auto z : host.out[i].Complexes()) h.insert(h.end(), {z.real(), z.imag()});
    }
    ASSERT_LE(h.size(), plain.out[i].size()) << where << " out" << i;
    EXPECT_TRUE(h.empty() ||
                std::memcmp(h.data(), plain.out[i].data(), h.size() * sizeof(double)) == 0)
        << where << " out" << i << " (" << count << " elements)";
    if (Modes(x.family) && !(x.family == Family::kPcarSpectrum && i == 3)) {
      EXPECT_EQ(count, plain.count) << where;
    }
  }
  for (int j = 0; j < x.doubles; ++j) {
    EXPECT_EQ(0, std::memcmp(&host.d[j], &plain.d[j], sizeof(double))) << where << " d" << j;
  }
  if (x.family == Family::kMdl) EXPECT_EQ(host.order, plain.count) << where;
}

// Argument values to walk through each integer slot of a family: zero, +-1,
// the order bound and one past it, the extremes.
std::vector<Scalars> ArgumentWalk(Family f) {
  std::vector<Scalars> walk;
  const Scalars v = Larger(f);
  const int32_t bound = 2 * v.n / 3;
  for (int slot = 0; slot < 3; ++slot) {
    for (int32_t value : {0, 1, -1, 2, bound, bound + 1, INT_MAX, INT_MIN, (1 << 30) + 1}) {
      Scalars s = v;
      (slot == 0 ? s.a : slot == 1 ? s.b : s.c) = value;
      walk.push_back(s);
    }
  }
  for (double fs : {0.0, -1.0}) {
    Scalars s = v;
    s.fs = fs;
    walk.push_back(s);
  }
  return walk;
}

TEST(PlainApi, SameNumbersAndCodesAsTheHostFace) {
  int compared = 0;
  for (const Export& x : Exports()) {
    const PlainFn& plain = PlainFunctions().at(x.name);
    std::vector<Scalars> cases = ArgumentWalk(x.family);
    cases.push_back(Valid(x.family));
    Scalars empty = Valid(x.family);
    empty.n = 0;
    cases.push_back(empty);
    for (const Scalars& s : cases) {
      const std::string where = std::string(x.name) + " a=" + std::to_string(s.a) +
                                " b=" + std::to_string(s.b) + " c=" + std::to_string(s.c) +
                                " n=" + std::to_string(s.n) + " fs=" + std::to_string(s.fs);
      Call host = MakeCall(x, s);
      const int32_t host_status = x.invoke(Qdm(), host, s);
      const std::vector<double> data = Samples(x.complexData, s.n);
      PlainCall p;
      const int32_t plain_status = plain(s.n > 0 ? data.data() : &kStale, s, p);
      if (host_status == 0) {
        ASSERT_TRUE(plain_status == QDM_OK || plain_status == QDM_WARN_RANK_DEFICIENT)
            << where << ": " << plain_status;
        ExpectSameResults(x, host, p, where);
        ++compared;
      } else {
        EXPECT_EQ(plain_status, host_status) << where;
      }
    }
  }
  RecordProperty("compared", compared);
}

TEST(PlainApi, RefusesWhatTheHostFaceLetsThrough) {
  const double inf = std::numeric_limits<double>::infinity();
  const double nan = std::numeric_limits<double>::quiet_NaN();
  for (const Export& x : Exports()) {
    const PlainFn& plain = PlainFunctions().at(x.name);
    const Scalars s = Larger(x.family);
    for (double bad : {nan, inf, -inf}) {
      std::vector<double> data = Samples(x.complexData, s.n);
      data[7] = bad;
      PlainCall p;
      EXPECT_EQ(plain(data.data(), s, p), QDM_ERR_NON_FINITE) << x.name << " sample " << bad;
      if (x.family != Family::kCovariance && x.family != Family::kPcar &&
          x.family != Family::kMdl) {
        Scalars r = s;
        r.fs = nan;  // passes the shared check, as on the host face
        data[7] = 0.5;
        EXPECT_EQ(plain(data.data(), r, p), QDM_ERR_NON_FINITE) << x.name << " rate";
      }
    }
    PlainCall p;
    EXPECT_EQ(plain(nullptr, s, p), QDM_ERR_NULL_POINTER) << x.name;
  }
  // Work memory past the bound is refused before anything is allocated.
  std::vector<double> big(1 << 21, 0.25);
  std::vector<double> spectrum(1);
  double f0, df, var;
  NumAllocFailAt(1, true);
  EXPECT_EQ(qdm_covariance_psd_real(big.data(), 64, 4, 1 << 30, 1.0, spectrum.data(), &f0, &df,
                                    &var),
            QDM_ERR_WORK_LIMIT);
  double m[4];
  int32_t modes;
  EXPECT_EQ(qdm_matrix_pencil_real(big.data(), 1 << 21, 1 << 20, 4, 1.0, 0, m, m, m, m, &modes,
                                   &var),
            QDM_ERR_WORK_LIMIT);
  NumAllocFailAt(0, false);
}

// Each work allocation failed in turn, once and from then on, and each LAPACK
// driver call made to report INFO > 0 and INFO < 0: every call ends with the
// clean run's exact results or with an error and emptied outputs. Never
// success with other numbers.
struct Fault {
  const char* name;
  std::function<void(int64_t k)> arm;  // k = 0 disarms
  std::function<int64_t()> reached;    // calls counted since arming
};

TEST(PlainApi, NoFailureIsReportedAsSuccess) {
  const Fault faults[] = {
      {"allocation", [](int64_t k) { NumAllocFailAt(k, false); }, NumAllocAttempts},
      {"allocations from", [](int64_t k) { NumAllocFailAt(k, true); }, NumAllocAttempts},
      {"lapack info 1", [](int64_t k) { LapackFailAt(k, 1, false); }, LapackCalls},
      {"lapack info -1", [](int64_t k) { LapackFailAt(k, -1, false); }, LapackCalls},
  };
  int64_t faulted = 0;
  for (const Export& x : Exports()) {
    const PlainFn& plain = PlainFunctions().at(x.name);
    for (const Scalars& s : {Valid(x.family), Larger(x.family)}) {
      const std::vector<double> data = Samples(x.complexData, s.n);
      PlainCall clean;
      const int32_t clean_status = plain(data.data(), s, clean);
      ASSERT_GE(clean_status, 0) << x.name;
      for (const Fault& fault : faults) {
        for (int64_t k = 1;; ++k) {
          PlainCall p;
          const int64_t before = NumAllocOutstanding();
          fault.arm(k);
          const int32_t st = plain(data.data(), s, p);
          const bool reached = fault.reached() >= k;
          fault.arm(0);
          const std::string where = std::string(x.name) + " n=" + std::to_string(s.n) + " " +
                                    fault.name + " " + std::to_string(k);
          ASSERT_EQ(NumAllocOutstanding(), before) << where;
          if (!reached) break;
          ++faulted;
          if (st >= 0) {
            EXPECT_EQ(st, clean_status) << where;
            for (int i = 0; i < 4; ++i) EXPECT_EQ(p.out[i], clean.out[i]) << where << " out" << i;
            EXPECT_EQ(p.count, clean.count) << where;
          } else {
            for (int i = 0; i < 4; ++i) {
              for (double v : p.out[i]) ASSERT_EQ(v, 0.0) << where << " out" << i;
            }
            if (Modes(x.family) || x.family == Family::kMdl) EXPECT_EQ(p.count, 0) << where;
            for (int j = 0; j < x.doubles; ++j) EXPECT_EQ(p.d[j], 0.0) << where << " d" << j;
          }
        }
      }
    }
  }
  RecordProperty("faulted_calls", static_cast<int>(faulted));
  std::printf("plain face: %lld faulted calls, none reported as success\n",
              static_cast<long long>(faulted));
}

TEST(PlainApi, EveryStatusHasItsOwnText) {
  std::set<std::string> texts;
  int entries = 0;
#define QDM_TEST_STATUS(name, code, text)             \
  EXPECT_STREQ(qdm_status_text(code), text) << #name; \
  texts.insert(text);                                 \
  ++entries;
  QDM_STATUS_TABLE(QDM_TEST_STATUS)
#undef QDM_TEST_STATUS
  EXPECT_EQ(texts.size(), static_cast<size_t>(entries));
  EXPECT_STRNE(qdm_status_text(-42400 - 1000), qdm_status_text(12345));
  EXPECT_STREQ(qdm_version(), QDM_VERSION_STRING);
}

}  // namespace
