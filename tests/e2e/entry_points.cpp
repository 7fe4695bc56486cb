// The fourteen analysis exports as the host sees them: argument checks and
// their host codes, the resizes each export makes (order, type codes, lengths),
// what failure leaves in the outputs, and the failed-resize asymmetry. None of
// this depends on what the estimators compute, so every case holds whether an
// estimator succeeds or fails on valid input.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <functional>
#include <limits>
#include <string>
#include <vector>

#include "support/export_table.h"
#include "support/qdm_host.h"

namespace {

using namespace qdmtest;

struct CheckRow {
  const char* what;
  std::function<void(Scalars&)> change;
  int32_t host;  // 0: the call passes the checks
};

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

std::vector<CheckRow> Rows(Family f) {
  const int32_t e = HostCode(1);
  switch (f) {
    case Family::kProny:
    case Family::kCovariance: {
      std::vector<CheckRow> rows = {
          {"n = 0", [](Scalars& s) { s.n = 0; }, e},
          {"n = 0 before p = 0", [](Scalars& s) { s.n = 0, s.a = 0; }, e},
          {"p = 0", [](Scalars& s) { s.a = 0; }, HostCode(12)},
          {"p < 0", [](Scalars& s) { s.a = -3; }, HostCode(12)},
          {"p = 2n/3 + 1", [](Scalars& s) { s.a = 9; }, HostCode(12)},
          {"p = 2n/3 + 1, n = 13", [](Scalars& s) { s.n = 13, s.a = 9; }, HostCode(12)},
          {"n = 1", [](Scalars& s) { s.n = 1, s.a = 1; }, HostCode(12)},
          {"p = 2n/3", [](Scalars& s) { s.a = 8; }, 0},
          {"p = 2n/3, n = 14", [](Scalars& s) { s.n = 14, s.a = 9; }, 0},
      };
      if (f == Family::kProny) {
        rows.push_back({"rate = 0", [](Scalars& s) { s.fs = 0; }, HostCode(18)});
        rows.push_back({"rate < 0", [](Scalars& s) { s.fs = -1; }, HostCode(18)});
        rows.push_back({"rate -inf", [](Scalars& s) { s.fs = -INFINITY; }, HostCode(18)});
        rows.push_back({"p before rate", [](Scalars& s) { s.a = 0, s.fs = 0; }, HostCode(12)});
        rows.push_back({"rate NaN", [](Scalars& s) { s.fs = kNaN; }, 0});
      }
      return rows;
    }
    case Family::kPcar:
      return {
          {"n = 0", [](Scalars& s) { s.n = 0; }, e},
          {"p < 0", [](Scalars& s) { s.a = -1; }, HostCode(11)},
          {"p = 2n/3 + 1", [](Scalars& s) { s.a = 9; }, HostCode(11)},
          {"components = 0", [](Scalars& s) { s.b = 0; }, HostCode(12)},
          {"components < 0", [](Scalars& s) { s.b = -2; }, HostCode(12)},
          {"components > p", [](Scalars& s) { s.b = 5; }, HostCode(13)},
          {"p = 0", [](Scalars& s) { s.a = 0, s.b = 1; }, HostCode(13)},
          {"p = 0, components = 0", [](Scalars& s) { s.a = 0, s.b = 0; }, HostCode(12)},
          {"p before components", [](Scalars& s) { s.a = 9, s.b = 0; }, HostCode(11)},
          {"p = 2n/3", [](Scalars& s) { s.a = 8; }, 0},
          {"components = p", [](Scalars& s) { s.b = 4; }, 0},
      };
    case Family::kPencil:
      return {
          {"n = 0", [](Scalars& s) { s.n = 0; }, e},
          {"L < 0", [](Scalars& s) { s.a = -1; }, HostCode(11)},
          {"L = 2n/3 + 1", [](Scalars& s) { s.a = 9; }, HostCode(11)},
          {"M = 0", [](Scalars& s) { s.b = 0; }, HostCode(12)},
          {"M > L", [](Scalars& s) { s.b = 5; }, HostCode(13)},
          {"L = 0", [](Scalars& s) { s.a = 0, s.b = 1; }, HostCode(13)},
          {"rate = 0", [](Scalars& s) { s.fs = 0; }, HostCode(18)},
          {"M before rate", [](Scalars& s) { s.b = 5, s.fs = -1; }, HostCode(13)},
          {"L = 2n/3", [](Scalars& s) { s.a = 8; }, 0},
          {"M = L", [](Scalars& s) { s.b = 4; }, 0},
          {"rate NaN", [](Scalars& s) { s.fs = kNaN; }, 0},
      };
    case Family::kMdl:
      return {
          {"n = 0", [](Scalars& s) { s.n = 0; }, -42401},
          {"minOrder = 0", [](Scalars& s) { s.b = 0; }, -42414},
          {"minOrder < 0", [](Scalars& s) { s.b = -4; }, -42414},
          {"L = minOrder", [](Scalars& s) { s.a = 1; }, -42415},
          {"L < minOrder", [](Scalars& s) { s.a = 2, s.b = 3; }, -42415},
          {"L = 2n/3 + 1", [](Scalars& s) { s.a = 9; }, -42415},
          {"minOrder before L", [](Scalars& s) { s.a = 0, s.b = 0; }, -42414},
          {"L = 2n/3", [](Scalars& s) { s.a = 8; }, 0},
      };
    case Family::kCovSpectrum:
      return {
          {"n = 0", [](Scalars& s) { s.n = 0; }, e},
          {"p < 0", [](Scalars& s) { s.a = -1; }, HostCode(12)},
          {"p = 2n/3 + 1", [](Scalars& s) { s.a = 9; }, HostCode(12)},
          {"m = 1", [](Scalars& s) { s.b = 1; }, HostCode(17)},
          {"m = 0", [](Scalars& s) { s.b = 0; }, HostCode(17)},
          {"m beyond 2^30", [](Scalars& s) { s.b = (1 << 30) + 1; }, HostCode(17)},
          {"rate = 0", [](Scalars& s) { s.fs = 0; }, HostCode(18)},
          {"m before rate", [](Scalars& s) { s.b = 1, s.fs = 0; }, HostCode(17)},
          {"p = 0", [](Scalars& s) { s.a = 0; }, 0},
          {"p = 2n/3", [](Scalars& s) { s.a = 8; }, 0},
          {"m = 2", [](Scalars& s) { s.b = 2; }, 0},
          {"rate NaN", [](Scalars& s) { s.fs = kNaN; }, 0},
      };
    case Family::kPcarSpectrum:
      return {
          {"n = 0", [](Scalars& s) { s.n = 0; }, e},
          {"p < 0", [](Scalars& s) { s.a = -1; }, HostCode(11)},
          {"p = 2n/3 + 1", [](Scalars& s) { s.a = 9; }, HostCode(11)},
          {"k = 0", [](Scalars& s) { s.c = 0; }, HostCode(12)},
          {"k > p", [](Scalars& s) { s.c = 5; }, HostCode(13)},
          {"p = 0", [](Scalars& s) { s.a = 0; }, HostCode(13)},
          {"m = 1", [](Scalars& s) { s.b = 1; }, HostCode(17)},
          {"rate < 0", [](Scalars& s) { s.fs = -1; }, HostCode(18)},
          {"k before m", [](Scalars& s) { s.c = 0, s.b = 1; }, HostCode(12)},
          {"m before rate", [](Scalars& s) { s.b = 0, s.fs = 0; }, HostCode(17)},
          {"p = 2n/3", [](Scalars& s) { s.a = 8; }, 0},
          {"k = p", [](Scalars& s) { s.c = 4; }, 0},
          {"rate NaN", [](Scalars& s) { s.fs = kNaN; }, 0},
      };
  }
  return {};
}

TEST(EntryChecks, EveryFailingArgumentGivesItsHostCodeAndEmptiesTheOutputs) {
  const QdmApi& qdm = Qdm();
  for (const Export& x : Exports()) {
    for (const CheckRow& row : Rows(x.family)) {
      if (row.host == 0) continue;
      Scalars s = Valid(x.family);
      row.change(s);
      const std::string where = std::string(x.name) + ": " + row.what;
      Call c = MakeCall(x, s);
      const int64_t mark = qdmtest::ResizeMark();
      EXPECT_EQ(x.invoke(qdm, c, s), row.host) << where;
      // The only resizes are the ones that empty the outputs.
      EXPECT_EQ(ResizesSince(mark), EmptyingResizes(x, s)) << where;
      ExpectEmptied(x, c, where);
      EXPECT_EQ(c.order, kStaleOrder) << where;  // MDL: result untouched
    }
  }
}

TEST(EntryChecks, BoundaryAndNaNRateCasesPassTheChecks) {
  const QdmApi& qdm = Qdm();
  for (const Export& x : Exports()) {
    for (const CheckRow& row : Rows(x.family)) {
      if (row.host != 0) continue;
      Scalars s = Valid(x.family);
      row.change(s);
      const std::string where = std::string(x.name) + ": " + row.what;
      Call c = MakeCall(x, s);
      const int64_t mark = qdmtest::ResizeMark();
      const int32_t st = x.invoke(qdm, c, s);
      // Reaching the resizes with the full lengths is passing the checks.
      const std::vector<ResizeCall> expected = x.resizes(s);
      std::vector<ResizeCall> made = ResizesSince(mark);
      ASSERT_GE(made.size(), expected.size()) << where;
      made.resize(expected.size());
      EXPECT_EQ(made, expected) << where;
      if (x.family == Family::kMdl) {
        EXPECT_NE(st, -42401) << where;
        EXPECT_NE(st, -42414) << where;
        EXPECT_NE(st, -42415) << where;
      }
    }
  }
}

// On valid input the outcome is either success, with the counts the export
// writes, or an estimator failure, with every output emptied.
TEST(EntryPoints, ResizeOrderTypeCodesAndCounts) {
  const QdmApi& qdm = Qdm();
  for (const Export& x : Exports()) {
    const Scalars s = Valid(x.family);
    Call c = MakeCall(x, s);
    const int64_t mark = qdmtest::ResizeMark();
    const int32_t st = x.invoke(qdm, c, s);
    const std::vector<ResizeCall> expected = x.resizes(s);
    std::vector<ResizeCall> made = ResizesSince(mark);
    if (st != 0) {
      std::vector<ResizeCall> all = expected;
      for (const ResizeCall& r : EmptyingResizes(x, s)) all.push_back(r);
      EXPECT_EQ(made, all) << x.name << " status " << st;
      ExpectEmptied(x, c, x.name, /*estimatorMayHaveRun=*/true);
      continue;
    }
    EXPECT_EQ(made, expected) << x.name;
    switch (x.family) {
      case Family::kCovariance:
      case Family::kPcar:
        EXPECT_EQ(c.out[0].Count(), s.a) << x.name;
        EXPECT_EQ(c.out[1].Count(), s.a + 1) << x.name;
        break;
      case Family::kProny:
      case Family::kPencil:
      case Family::kPcarSpectrum: {
        const int32_t capacity = x.family == Family::kProny    ? s.a
                                 : x.family == Family::kPencil ? s.b
                                                               : s.c;
        EXPECT_GE(c.out[0].Count(), 0) << x.name;
        EXPECT_LE(c.out[0].Count(), capacity) << x.name;
        for (int i = 1; i < 3; ++i) EXPECT_EQ(c.out[i].Count(), c.out[0].Count()) << x.name;
        if (x.family == Family::kPcarSpectrum) {
          EXPECT_EQ(c.out[3].Count(), SpectrumN(s.b)) << x.name;
        } else {
          EXPECT_EQ(c.out[3].Count(), c.out[0].Count()) << x.name;
        }
        break;
      }
      case Family::kCovSpectrum:
        EXPECT_EQ(c.out[0].Count(), SpectrumN(s.b)) << x.name;
        break;
      case Family::kMdl:
        EXPECT_GE(c.order, s.b) << x.name;
        EXPECT_LE(c.order, s.a) << x.name;
        break;
    }
  }
}

TEST(EntryPoints, SpectrumLengthIsTheSmallestPowerOfTwoNotBelowM) {
  const QdmApi& qdm = Qdm();
  const struct {
    int32_t m, N;
  } sizes[] = {{2, 2}, {3, 4}, {5, 8}, {512, 512}, {513, 1024}, {1000, 1024}};
  for (const Export& x : Exports()) {
    if (x.family != Family::kCovSpectrum && x.family != Family::kPcarSpectrum) continue;
    for (const auto& size : sizes) {
      Scalars s = Valid(x.family);
      s.b = size.m;
      Call c = MakeCall(x, s);
      const int64_t mark = qdmtest::ResizeMark();
      (void)x.invoke(qdm, c, s);
      const std::vector<ResizeCall> made = ResizesSince(mark);
      const size_t spectrum = static_cast<size_t>(x.outputs - 1);
      ASSERT_GT(made.size(), spectrum) << x.name;
      EXPECT_EQ(made[spectrum], (ResizeCall{kR, 1, static_cast<size_t>(size.N)}))
          << x.name << " m = " << size.m;
    }
  }
}

// A resize that fails with host error e returns -42400 - e (e > 0) or e
// (e < 0). QdmRePronyH and QdmRePCARPowerSpectrumH return at once, leaving the
// outputs as they were; every other export, their complex twins included,
// empties its outputs.
TEST(EntryPoints, FailedResize) {
  const QdmApi& qdm = Qdm();
  for (const Export& x : Exports()) {
    for (int skip = 0; skip < x.outputs; ++skip) {
      for (int32_t error : {3, -7}) {
        const Scalars s = Valid(x.family);
        const std::string where =
            std::string(x.name) + " resize " + std::to_string(skip) + " error " +
            std::to_string(error);
        Call c = MakeCall(x, s);
        const int64_t mark = qdmtest::ResizeMark();
        EmuFailResize(skip, error);
        const int32_t st = x.invoke(qdm, c, s);
        EmuFailResize(0, 0);
        EXPECT_EQ(st, error > 0 ? -42400 - error : error) << where;
        std::vector<ResizeCall> expected = x.resizes(s);
        expected.resize(static_cast<size_t>(skip) + 1);
        if (x.failedResizeReturns) {
          EXPECT_EQ(ResizesSince(mark), expected) << where;
          for (int i = 0; i < x.outputs; ++i) {
            EXPECT_EQ(c.out[i].Count(), kStaleCount) << where << " out" << i;
            // Resized before the failure: new size; from the failing one on: as they were.
            EXPECT_EQ(c.out[i].Capacity(),
                      i < skip ? expected[static_cast<size_t>(i)].count : size_t{kStaleCount})
                << where << " out" << i;
            if (i >= skip) {
              EXPECT_EQ(c.out[i].Reals(), std::vector<double>(kStaleCount, kStale)) << where;
            }
          }
          for (int j = 0; j < x.doubles; ++j) EXPECT_EQ(c.d[j], kStale) << where;
        } else {
          for (const ResizeCall& r : EmptyingResizes(x, s)) expected.push_back(r);
          EXPECT_EQ(ResizesSince(mark), expected) << where;
          ExpectEmptied(x, c, where);
        }
      }
    }
  }
}

TEST(EntryPoints, InputIsReadInPlaceAndLeftUnchanged) {
  const QdmApi& qdm = Qdm();
  for (const Export& x : Exports()) {
    const Scalars s = Valid(x.family);
    Call c = MakeCall(x, s);
    const std::vector<double> before = c.data.Reals(s.n * (x.complexData ? 2 : 1));
    (void)x.invoke(qdm, c, s);
    EXPECT_EQ(c.data.Count(), s.n) << x.name;
    EXPECT_EQ(c.data.Reals(s.n * (x.complexData ? 2 : 1)), before) << x.name;
  }
}


// ---- integer arguments at their extremes --------------------------------------------
// Every integer argument of every export walked through 0, +-1, the check
// limits, 2^30 and the ends of the 32-bit range, the others kept valid. The
// expected code comes from the check table written out again here, in 64-bit
// arithmetic. A call that passes its checks has its last resize failed (host
// error 3), so that the length it asks for is seen without being allocated
// and no estimator runs on it. Under UBSan this is also the test that no size
// is computed from an argument before it is checked.

// Internal code of the first failing check, 0 when all pass.
int32_t ExpectedCheckCode(Family f, const Scalars& s) {
  const int64_t bound = (2 * int64_t{s.n}) / 3;
  const bool badRate = !(s.fs > 0) && !std::isnan(s.fs);
  const bool badM = s.b <= 1 || s.b > (int64_t{1} << 30);
  if (s.n < 1) return 1;
  switch (f) {
    case Family::kProny:
      if (s.a <= 0 || s.a > bound) return 12;
      return badRate ? 18 : 0;
    case Family::kCovariance:
      return (s.a <= 0 || s.a > bound) ? 12 : 0;
    case Family::kPcar:
      if (s.a < 0 || s.a > bound) return 11;
      if (s.b <= 0) return 12;
      return s.b > s.a ? 13 : 0;
    case Family::kPencil:
      if (s.a < 0 || s.a > bound) return 11;
      if (s.b <= 0) return 12;
      if (s.b > s.a) return 13;
      return badRate ? 18 : 0;
    case Family::kMdl:
      if (s.b < 1) return 14;
      return (s.a <= s.b || s.a > bound) ? 15 : 0;
    case Family::kCovSpectrum:
      if (s.a < 0 || s.a > bound) return 12;
      if (badM) return 17;
      return badRate ? 18 : 0;
    case Family::kPcarSpectrum:
      if (s.a < 0 || s.a > bound) return 11;
      if (s.c <= 0) return 12;
      if (s.c > s.a) return 13;
      if (badM) return 17;
      return badRate ? 18 : 0;
  }
  return -1;
}

int IntegerArguments(Family f) {
  switch (f) {
    case Family::kProny:
    case Family::kCovariance: return 1;
    case Family::kPcarSpectrum: return 3;
    default: return 2;
  }
}

TEST(EntryChecks, IntegerArgumentsAtTheirExtremes) {
  const QdmApi& qdm = Qdm();
  constexpr int32_t kTwo30 = INT32_C(1) << 30;
  const int32_t values[] = {INT32_MIN, INT32_MIN + 1, -1, 0, 1, 2, 8, 9, kTwo30 - 1,
                            kTwo30,    kTwo30 + 1,    INT32_MAX - 1, INT32_MAX};
  constexpr int32_t kInjected = 3;
  int calls = 0;
  for (const Export& x : Exports()) {
    for (int arg = 0; arg < IntegerArguments(x.family); ++arg) {
      for (int32_t v : values) {
        Scalars s = Valid(x.family);
        (arg == 0 ? s.a : arg == 1 ? s.b : s.c) = v;
        const std::string where = std::string(x.name) + " argument " + std::to_string(arg) +
                                  " = " + std::to_string(v);
        const int32_t code = ExpectedCheckCode(x.family, s);
        Call c = MakeCall(x, s);
        const int64_t mark = qdmtest::ResizeMark();
        if (code == 0 && x.outputs > 0) EmuFailResize(x.outputs - 1, kInjected);
        const int32_t st = x.invoke(qdm, c, s);
        EmuFailResize(0, 0);
        ++calls;
        if (x.family == Family::kMdl) {
          if (code != 0) EXPECT_EQ(st, HostCode(code)) << where;
          else EXPECT_TRUE(st != HostCode(14) && st != HostCode(15)) << where;
          continue;
        }
        if (code != 0) {
          EXPECT_EQ(st, HostCode(code)) << where;
          EXPECT_EQ(ResizesSince(mark), EmptyingResizes(x, s)) << where;
          ExpectEmptied(x, c, where);
          continue;
        }
        EXPECT_EQ(st, HostCode(kInjected)) << where;
        std::vector<ResizeCall> made = ResizesSince(mark);
        const std::vector<ResizeCall> asked = x.resizes(s);
        ASSERT_GE(made.size(), asked.size()) << where;
        made.resize(asked.size());
        EXPECT_EQ(made, asked) << where;
      }
    }
  }
  RecordProperty("calls", calls);
}

}  // namespace
