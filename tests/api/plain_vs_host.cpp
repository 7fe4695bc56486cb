// The plain C API against the host face on the same inputs (same numbers, same
// codes), what the plain face adds (non-finite input, null pointers, the work
// bound), and its rule that no failure inside a fit is reported as success.
// The plain face runs in this process, from the same core objects, so the
// allocation and LAPACK hooks are reachable; the host face is the built libqdm.
#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <set>
#include <string>

#include "numeric/lapack_boundary.h"
#include "numeric/work.h"
#include "support/plain_table.h"

namespace {

using namespace qdmtest;

// Each integer slot of the longer argument set walked through zero, +-1, the
// order bound and one past it, the extremes; then a zero and a negative rate,
// an empty record and the valid set.
std::vector<Scalars> ArgumentWalk(Family f) {
  const Scalars v = ArgumentSets(f).back();
  const int32_t bound = 2 * v.n / 3;
  std::vector<Scalars> walk = {{v.n, v.a, v.b, v.c, 0.0}, {v.n, v.a, v.b, v.c, -1.0}, Valid(f)};
  walk.push_back(Valid(f)), walk.back().n = 0;
  for (int slot = 0; slot < 3; ++slot) {
    for (int32_t value : {0, 1, -1, 2, bound, bound + 1, INT_MAX, INT_MIN, (1 << 30) + 1}) {
      Scalars s = v;
      (slot == 0 ? s.a : slot == 1 ? s.b : s.c) = value;
      walk.push_back(s);
    }
  }
  return walk;
}

TEST(PlainApi, SameNumbersAndCodesAsTheHostFace) {
  int compared = 0, refusedShort = 0;
  for (const Export& x : Exports()) {
    for (const Scalars& s : ArgumentWalk(x.family)) {
      const std::string where = Where(x, s);
      Call host = MakeCall(x, s);
      const int32_t hostStatus = x.invoke(Qdm(), host, s);
      const std::vector<double> data = Samples(x.complexData, s.n);
      PlainCall p;
      const int32_t plainStatus = CallPlain(x, s.n > 0 ? data.data() : &kStale, s, p);
      if (hostStatus != 0) {
        EXPECT_EQ(plainStatus, hostStatus) << where;
        continue;
      }
      if (SpectrumTooShort(x, s)) {
        EXPECT_EQ(plainStatus, QDM_ERR_SPECTRUM_TOO_SHORT) << where;
        EXPECT_EQ(p.out[0][0], kStale) << where;  // nothing written
        EXPECT_EQ(p.d[0], kStale) << where;
        ++refusedShort;
        continue;
      }
      ASSERT_TRUE(plainStatus == QDM_OK || plainStatus == QDM_WARN_RANK_DEFICIENT) << where;
      ++compared;
      for (int i = 0; i < x.outputs; ++i) {  // bit for bit
        const std::vector<double> h = Values(x, host, s, i);
        ASSERT_LE(h.size(), p.out[i].size()) << where << " out" << i;
        EXPECT_TRUE(h.empty() || std::memcmp(h.data(), p.out[i].data(), h.size() * 8) == 0)
            << where << " out" << i;
        if (Modes(x.family) && !(x.family == Family::kPcarSpectrum && i == 3)) {
          EXPECT_EQ(host.out[i].Count(), p.count) << where;
        }
      }
      EXPECT_EQ(0, std::memcmp(host.d, p.d, size_t(x.doubles) * 8)) << where;
      EXPECT_EQ(host.order, x.family == Family::kMdl ? p.count : kStaleOrder) << where;
    }
  }
  RecordProperty("compared", compared);
  EXPECT_GT(refusedShort, 0);
}

TEST(PlainApi, RefusesWhatTheHostFaceLetsThrough) {
  for (const Export& x : Exports()) {
    const Scalars s = ArgumentSets(x.family).back();
    for (double bad : {double(NAN), double(INFINITY), -double(INFINITY)}) {
      std::vector<double> data = Samples(x.complexData, s.n);
      data[7] = bad;
      PlainCall p;
      EXPECT_EQ(CallPlain(x, data.data(), s, p), QDM_ERR_NON_FINITE) << x.name << " " << bad;
      if (x.family != Family::kCovariance && x.family != Family::kPcar &&
          x.family != Family::kMdl) {
        Scalars r = s;
        r.fs = NAN;  // passes the shared check, as on the host face
        data[7] = 0.5;
        EXPECT_EQ(CallPlain(x, data.data(), r, p), QDM_ERR_NON_FINITE) << x.name << " rate";
      }
    }
    PlainCall p;
    EXPECT_EQ(CallPlain(x, nullptr, s, p), QDM_ERR_NULL_POINTER) << x.name;
  }
  // Work memory past the bound is refused before anything is allocated.
  std::vector<double> big(1 << 21, 0.25);
  double m[4], f0, df, var;
  int32_t modes;
  NumAllocFailAt(1, true);
  EXPECT_EQ(qdm_covariance_psd_real(big.data(), 64, 4, 1 << 30, 1.0, m, &f0, &df, &var),
            QDM_ERR_WORK_LIMIT);
  // The dense pencil of 2^21 samples at L = 2^20 would hold two 2^20-square
  // matrices; the Krylov route, which the automatic choice takes, fits in the
  // bound and so reaches its first allocation (failed here). An unknown solver
  // is refused before anything else.
  EXPECT_EQ(qdm_matrix_pencil_solver_real(big.data(), 1 << 21, 1 << 20, 4, 1.0, 0, QDM_SOLVER_DENSE,
                                          m, m, m, m, &modes, &var),
            QDM_ERR_WORK_LIMIT);
  EXPECT_EQ(
      qdm_matrix_pencil_real(big.data(), 1 << 21, 1 << 20, 4, 1.0, 0, m, m, m, m, &modes, &var),
      QDM_ERR_NO_MEMORY);
  for (const int32_t solver : {-1, 3}) {
    EXPECT_EQ(qdm_matrix_pencil_solver_real(big.data(), 1 << 21, 1 << 20, 4, 1.0, 0, solver, m, m,
                                            m, m, &modes, &var),
              QDM_ERR_SOLVER);
  }
  NumAllocFailAt(0, false);
}

// Each work allocation failed in turn (once, from then on), each LAPACK driver
// call made to report INFO > 0 (once, from then on) and INFO < 0. The plain face
// turns every failure it hears of into an error: a call fails iff its fault was reached.
TEST(PlainApi, NoFailureIsReportedAsSuccess) {
  int64_t faulted = 0;
  for (const Export& x : Exports()) {
    for (const Scalars& s : ArgumentSets(x.family)) {
      if (SpectrumTooShort(x, s)) continue;
      const std::vector<double> data = Samples(x.complexData, s.n);
      PlainCall clean;
      const int32_t cleanStatus = CallPlain(x, data.data(), s, clean);
      ASSERT_GE(cleanStatus, 0) << Where(x, s);
      for (int fault = 0; fault < 5; ++fault) {  // allocation once, from; INFO 1, -1, 1 from
        for (int64_t k = 1;; ++k) {
          const std::string where =
              Where(x, s) + " fault " + std::to_string(fault) + " k=" + std::to_string(k);
          PlainCall p;
          if (fault < 2) NumAllocFailAt(k, fault == 1);
          if (fault >= 2) LapackFailAt(k, fault == 3 ? -1 : 1, fault == 4);
          const int32_t st = CallPlain(x, data.data(), s, p);
          const bool reached = (fault < 2 ? NumAllocAttempts() : LapackCalls()) >= k;
          NumAllocFailAt(0, false);
          LapackFailAt(0, 0, false);
          ASSERT_EQ(NumAllocOutstanding(), 0) << where;
          EXPECT_TRUE(FaultedPlainCallIsRight(x, cleanStatus, clean, st, p) && reached == (st < 0))
              << where << ": status " << st;
          if (!reached) break;
          ++faulted;
        }
      }
    }
  }
  RecordProperty("faulted_calls", static_cast<int>(faulted));
  std::printf("plain face: %lld faulted calls, none reported as success\n",
              static_cast<long long>(faulted));
}

// The codes the library documents, written out here rather than taken from
// the status table: the host face's (empty input, the argument codes 11..18,
// memory, the numeric and FFT failures, the rank warning) and the plain face's
// own refusals and failures. The table must hold exactly these, each with a
// text of its own, none of them the text of an unknown code.
TEST(PlainApi, EveryDocumentedStatusHasItsOwnText) {
  const std::set<int32_t> documented = {0,      20001,  -42401, -42411, -42412, -42413, -42414,
                                        -42415, -42416, -42417, -42418, -20001, -20003, -20004,
                                        -20061, -20062, -20063, -20068, -20116, -20999, -1,
                                        -42419, -42420, -42421, -42422, -42423, -30001, -20070,
                                        20002,  -42424, -42425, -42426, -42427, 20003,  -42428};
  std::set<int32_t> table;
#define QDM_TEST_STATUS(name, code, text) table.insert(code);
  QDM_STATUS_TABLE(QDM_TEST_STATUS)
#undef QDM_TEST_STATUS
  EXPECT_EQ(table, documented);
  const std::string unknown = qdm_status_text(12345);
  std::set<std::string> texts;
  for (int32_t code : documented) {
    const std::string text = qdm_status_text(code);
    EXPECT_NE(text, unknown) << code;
    EXPECT_FALSE(text.empty()) << code;
    texts.insert(text);
  }
  EXPECT_EQ(texts.size(), documented.size());
  // Codes next to documented ones are unknown (other -424xx codes are the
  // host's resize errors, which have their own text).
  for (int32_t code : {1, 11, 20004, -20002, -30000, -2}) {
    EXPECT_EQ(std::string(qdm_status_text(code)), unknown) << code;
  }
}

}  // namespace
