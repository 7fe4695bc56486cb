// Each row is one argument set of the fourteen analysis exports and the internal code it
// must give (0: the checks pass); integers walk 0, 1, the limits, 2^30 and the 32-bit ends.
// A failing set gives its host code, only empties the outputs, zeroes the out doubles and
// leaves the MDL result. A passing set asks for the documented resizes, the last one failed
// (host error 3): two exports keep their outputs, the others empty them.
#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <limits>
#include <string>
#include <vector>

#include "support/export_table.h"
#include "support/qdm_host.h"

namespace {

using namespace qdmtest;

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN(), kInf = INFINITY;
constexpr int32_t kMin = INT32_MIN, kMax = INT32_MAX, k30 = INT32_C(1) << 30;

struct Row {
  Family family;
  int32_t n, a, b, c;  // a, b, c: the family's integers in argument order (Scalars)
  int32_t code;        // internal code of the first failing check, 0 when all pass
  double fs = 1;
};

constexpr Family P = Family::kProny, V = Family::kCovariance, R = Family::kPcar,
                 L = Family::kPencil, M = Family::kMdl, S = Family::kCovSpectrum,
                 Q = Family::kPcarSpectrum;

// n = 12 bounds every order by floor(24/3) = 8; n = 13 keeps 8, n = 14 gives 9. p = 0 passes
// the covariance spectrum's checks (the estimator refuses it).
const Row kRows[] = {
    {P, 0, 2, 0, 0, 1},          {P, 0, 0, 0, 0, 1},         {P, 1, 1, 0, 0, 12},
    {P, 12, kMin, 0, 0, 12},     {P, 12, 0, 0, 0, 12},       {P, 12, 1, 0, 0, 0},
    {P, 12, 8, 0, 0, 0},         {P, 12, 9, 0, 0, 12},       {P, 13, 9, 0, 0, 12},
    {P, 14, 9, 0, 0, 0},         {P, 12, kMax, 0, 0, 12},    {P, 12, 2, 0, 0, 18, 0},
    {P, 12, 2, 0, 0, 18, -kInf}, {P, 12, 0, 0, 0, 12, 0},    {P, 12, 2, 0, 0, 0, kNaN},
    {P, 12, 2, 0, 0, 0, kInf},   {V, 0, 2, 0, 0, 1},         {V, 1, 1, 0, 0, 12},
    {V, 12, kMin, 0, 0, 12},     {V, 12, 0, 0, 0, 12},       {V, 12, 1, 0, 0, 0},
    {V, 12, 8, 0, 0, 0},         {V, 12, 9, 0, 0, 12},       {V, 13, 9, 0, 0, 12},
    {V, 14, 9, 0, 0, 0},         {V, 12, kMax, 0, 0, 12},    {R, 0, 4, 2, 0, 1},
    {R, 1, 0, 1, 0, 13},         {R, 1, 1, 1, 0, 11},        {R, 12, kMin, 2, 0, 11},
    {R, 12, 0, 1, 0, 13},        {R, 12, 0, 0, 0, 12},       {R, 12, 8, 2, 0, 0},
    {R, 12, 9, 2, 0, 11},        {R, 12, kMax, 2, 0, 11},    {R, 12, 9, 0, 0, 11},
    {R, 12, 4, kMin, 0, 12},     {R, 12, 4, 0, 0, 12},       {R, 12, 4, 1, 0, 0},
    {R, 12, 4, 4, 0, 0},         {R, 12, 4, 5, 0, 13},       {R, 12, 4, kMax, 0, 13},
    {L, 0, 4, 2, 0, 1},          {L, 1, 0, 1, 0, 13},        {L, 12, kMin, 2, 0, 11},
    {L, 12, 0, 1, 0, 13},        {L, 12, 8, 2, 0, 0},        {L, 12, 9, 2, 0, 11},
    {L, 12, kMax, 2, 0, 11},     {L, 12, 4, kMin, 0, 12},    {L, 12, 4, 0, 0, 12},
    {L, 12, 4, 1, 0, 0},         {L, 12, 4, 4, 0, 0},        {L, 12, 4, 5, 0, 13},
    {L, 12, 4, kMax, 0, 13},     {L, 12, 4, 2, 0, 18, 0},    {L, 12, 4, 5, 0, 13, -1},
    {L, 12, 4, 2, 0, 18, -kInf}, {L, 12, 4, 2, 0, 0, kNaN},  {M, 0, 4, 1, 0, 1},
    {M, 1, 1, 1, 0, 15},         {M, 12, 4, kMin, 0, 14},    {M, 12, 4, 0, 0, 14},
    {M, 12, 0, 0, 0, 14},        {M, 12, 1, 1, 0, 15},       {M, 12, 2, 3, 0, 15},
    {M, 12, kMin, 1, 0, 15},     {M, 12, 8, 1, 0, 0},        {M, 12, 9, 1, 0, 15},
    {M, 12, kMax, 1, 0, 15},     {M, 12, 8, 7, 0, 0},        {M, 12, 8, 8, 0, 15},
    {M, 12, 4, kMax, 0, 15},     {S, 0, 2, 16, 0, 1},        {S, 1, 0, 16, 0, 0},
    {S, 1, 1, 16, 0, 12},        {S, 12, kMin, 16, 0, 12},   {S, 12, 0, 16, 0, 0},
    {S, 12, 8, 16, 0, 0},        {S, 12, 9, 16, 0, 12},      {S, 12, kMax, 16, 0, 12},
    {S, 12, 2, kMin, 0, 17},     {S, 12, 2, 0, 0, 17},       {S, 12, 2, 1, 0, 17},
    {S, 12, 2, 2, 0, 0},         {S, 12, 2, 3, 0, 0},        {S, 12, 2, 5, 0, 0},
    {S, 12, 2, 512, 0, 0},       {S, 12, 2, 513, 0, 0},      {S, 12, 2, k30 - 1, 0, 0},
    {S, 12, 2, k30, 0, 0},       {S, 12, 2, k30 + 1, 0, 17}, {S, 12, 2, kMax, 0, 17},
    {S, 12, 2, 16, 0, 18, 0},    {S, 12, 2, 1, 0, 17, 0},    {S, 12, 9, 1, 0, 12, 0},
    {S, 12, 2, 16, 0, 0, kNaN},  {Q, 0, 4, 16, 2, 1},        {Q, 1, 0, 16, 1, 13},
    {Q, 12, kMin, 16, 2, 11},    {Q, 12, 0, 16, 2, 13},      {Q, 12, 8, 16, 2, 0},
    {Q, 12, 9, 16, 2, 11},       {Q, 12, kMax, 16, 2, 11},   {Q, 12, 4, 16, kMin, 12},
    {Q, 12, 4, 16, 0, 12},       {Q, 12, 4, 16, 1, 0},       {Q, 12, 4, 16, 4, 0},
    {Q, 12, 4, 16, 5, 13},       {Q, 12, 4, 16, kMax, 13},   {Q, 12, 4, kMin, 2, 17},
    {Q, 12, 4, 1, 2, 17},        {Q, 12, 4, 2, 2, 0},        {Q, 12, 4, 1000, 2, 0},
    {Q, 12, 4, k30, 2, 0},       {Q, 12, 4, k30 + 1, 2, 17}, {Q, 12, 4, kMax, 2, 17},
    {Q, 12, 4, 1, 0, 12},        {Q, 12, 4, 0, 2, 17, 0},    {Q, 12, 4, 16, 2, 18, -1},
    {Q, 12, 4, 16, 2, 0, kNaN},
};

TEST(EntryChecks, EveryArgumentSetGivesItsCodeAndItsResizes) {
  constexpr int32_t kInjected = 3;
  for (const Row& row : kRows) {
    const Scalars s{row.n, row.a, row.b, row.c, row.fs};
    for (const Export& x : Exports()) {
      if (x.family != row.family) continue;
      const std::string where = std::string(x.name) + " row " + std::to_string(&row - kRows);
      Call c = MakeCall(x, s);
      const std::vector<double> input = c.data.Reals(s.n * (x.complexData ? 2 : 1));
      const int64_t mark = ResizeMark();
      if (row.code == 0 && x.outputs > 0) EmuFailResize(x.outputs - 1, kInjected);
      const int32_t st = x.invoke(Qdm(), c, s);
      EmuFailResize(0, 0);
      EXPECT_EQ(c.data.Reals(s.n * (x.complexData ? 2 : 1)), input) << where;
      if (row.code != 0) {
        EXPECT_EQ(st, HostCode(row.code)) << where;
        EXPECT_EQ(ResizesSince(mark), EmptyingResizes(x, s)) << where;
        ExpectEmptied(x, c, where);
        EXPECT_EQ(c.order, kStaleOrder) << where;
        continue;
      }
      if (x.family == Family::kMdl) {  // no outputs to resize: the estimator ran
        EXPECT_TRUE(st != HostCode(1) && st != HostCode(14) && st != HostCode(15)) << where;
        continue;
      }
      EXPECT_EQ(st, HostCode(kInjected)) << where;
      const bool keeps = x.failedResizeReturns;
      std::vector<ResizeCall> want = x.resizes(s), emptying = EmptyingResizes(x, s);
      if (!keeps) want.insert(want.end(), emptying.begin(), emptying.end());
      EXPECT_EQ(ResizesSince(mark), want) << where;
      if (!keeps) ExpectEmptied(x, c, where);
      for (int i = 0; keeps && i < x.outputs; ++i)
        EXPECT_EQ(c.out[i].Count(), kStaleCount) << where;
      for (int j = 0; keeps && j < x.doubles; ++j) EXPECT_EQ(c.d[j], kStale) << where;
    }
  }
}

// An order of 0 passes the covariance spectrum's checks: the outputs are sized
// for it, and only then is the order refused (12), the outputs emptied again.
TEST(EntryChecks, CovarianceSpectrumOfOrderZeroIsRefusedAfterItsResizes) {
  const Scalars s{12, 0, 16, 0, 1};
  for (const Export& x : Exports()) {
    if (x.family != Family::kCovSpectrum) continue;
    Call c = MakeCall(x, s);
    const int64_t mark = ResizeMark();
    EXPECT_EQ(x.invoke(Qdm(), c, s), HostCode(12)) << x.name;
    std::vector<ResizeCall> want = x.resizes(s), emptying = EmptyingResizes(x, s);
    want.insert(want.end(), emptying.begin(), emptying.end());
    EXPECT_EQ(ResizesSince(mark), want) << x.name;
    ExpectEmptied(x, c, x.name, true);
  }
}

}  // namespace
