// SortReal, MinMaxReal and the complex scalar helpers.

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <numbers>
#include <random>
#include <vector>

#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

// Bit-level equality so that NaN positions compare.
void ExpectSameValues(const std::vector<double>& got, const std::vector<double>& want) {
  ASSERT_EQ(got.size(), want.size());
  for (size_t i = 0; i < got.size(); ++i) {
    if (std::isnan(want[i])) {
      EXPECT_TRUE(std::isnan(got[i])) << "at " << i;
    } else {
      EXPECT_EQ(got[i], want[i]) << "at " << i;
    }
  }
}

struct SortCase {
  std::vector<double> in;
  int32_t descending;
  std::vector<double> want;
};

TEST(SortReal, TableOfCasesInPlaceAndIntoOut) {
  const double inf = std::numeric_limits<double>::infinity();
  const std::vector<SortCase> cases = {
      {{3, kNaN, 1, 2}, 0, {kNaN, 1, 2, 3}},
      {{3, kNaN, 1, 2}, 1, {kNaN, 3, 2, 1}},
      {{kNaN, kNaN}, 0, {kNaN, kNaN}},
      {{1, 2, kNaN, 0, kNaN, -5}, 0, {kNaN, kNaN, -5, 0, 1, 2}},
      {{1, 2, kNaN, 0, kNaN, -5}, 7, {kNaN, kNaN, 2, 1, 0, -5}},
      {{inf, -inf, 0, -0.0, 4}, 0, {-inf, 0, 0, 4, inf}},
      {{2, 2, 1, 2}, 1, {2, 2, 2, 1}},
  };
  for (const SortCase& tc : cases) {
    const int32_t n = static_cast<int32_t>(tc.in.size());
    std::vector<double> in_place = tc.in;
    ASSERT_EQ(SortReal(in_place.data(), n, tc.descending, nullptr), 0);
    ExpectSameValues(in_place, tc.want);

    std::vector<double> src = tc.in;
    std::vector<double> out(tc.in.size(), 99.0);
    ASSERT_EQ(SortReal(src.data(), n, tc.descending, out.data()), 0);
    ExpectSameValues(out, tc.want);
    ExpectSameValues(src, tc.in);  // the source stays as it was

    std::vector<double> same = tc.in;
    ASSERT_EQ(SortReal(same.data(), n, tc.descending, same.data()), 0);
    ExpectSameValues(same, tc.want);
  }
}

TEST(SortReal, RandomAgainstReferenceWithNaNsFirst) {
  std::mt19937_64 rng(7);
  std::uniform_real_distribution<double> value(-100.0, 100.0);
  for (int trial = 0; trial < 50; ++trial) {
    const size_t n = 1 + rng() % 300;
    std::vector<double> x(n);
    size_t nans = 0;
    for (double& v : x) {
      if (rng() % 5 == 0) {
        v = kNaN;
        ++nans;
      } else {
        v = std::round(value(rng));  // duplicates likely
      }
    }
    for (int32_t desc = 0; desc <= 1; ++desc) {
      std::vector<double> want;
      for (double v : x)
        if (!std::isnan(v)) want.push_back(v);
      std::sort(want.begin(), want.end());
      if (desc) std::reverse(want.begin(), want.end());
      want.insert(want.begin(), nans, kNaN);
      std::vector<double> got(n);
      ASSERT_EQ(SortReal(x.data(), static_cast<int32_t>(n), desc, got.data()), 0);
      ExpectSameValues(got, want);
    }
  }
}

TEST(SortReal, SizeChecksAndSingleValue) {
  double x[2] = {kNaN, 1.0};
  double out[2] = {5.0, 6.0};
  EXPECT_EQ(SortReal(x, 0, 0, out), status::kBadSize);
  EXPECT_EQ(SortReal(x, -3, 1, nullptr), status::kBadSize);
  EXPECT_EQ(out[0], 5.0);
  double one = kNaN;
  EXPECT_EQ(SortReal(&one, 1, 0, nullptr), 0);
  EXPECT_TRUE(std::isnan(one));
  EXPECT_EQ(SortReal(x, 1, 0, out), 0);
  EXPECT_TRUE(std::isnan(out[0]));
  EXPECT_EQ(out[1], 6.0);
  EXPECT_EQ(NumAllocOutstanding(), 0);
}

struct MinMaxCase {
  std::vector<double> in;
  double max_value;
  int32_t max_index;
  double min_value;
  int32_t min_index;
};

TEST(MinMaxReal, TableOfCases) {
  const std::vector<MinMaxCase> cases = {
      {{kNaN, 2, 5, 5, -1, -1}, 5, 2, -1, 4},
      {{kNaN, kNaN}, kNaN, -1, kNaN, -1},
      {{4}, 4, 0, 4, 0},
      {{1, kNaN, 3, kNaN, 0}, 3, 2, 0, 4},
      {{-2, -2, -2}, -2, 0, -2, 0},
      {{kNaN, 7, kNaN}, 7, 1, 7, 1},
  };
  for (const MinMaxCase& tc : cases) {
    double mx = 123.0, mn = 456.0;
    int32_t imx = 77, imn = 88;
    ASSERT_EQ(MinMaxReal(tc.in.data(), static_cast<int32_t>(tc.in.size()), &mx, &imx, &mn, &imn),
              0);
    ExpectSameValues({mx, mn}, {tc.max_value, tc.min_value});
    EXPECT_EQ(imx, tc.max_index);
    EXPECT_EQ(imn, tc.min_index);
  }
  double mx = 1.0, mn = 2.0;
  int32_t imx = 3, imn = 4;
  EXPECT_EQ(MinMaxReal(&mx, 0, &mx, &imx, &mn, &imn), status::kBadSize);
  EXPECT_EQ(imx, 3);
}

// ---- scalar helpers ------------------------------------------------------------------

TEST(ComplexScalars, SqrtCases) {
  struct Case {
    double re, im, want_re, want_im;
  };
  const std::vector<Case> cases = {
      {-4, 0, 0, 2},  {0, 0, 0, 0},      {4, 0, 2, 0}, {0, 2, 1, 1},
      {0, -2, 1, -1}, {-4, -0.0, 0, -2}, {3, 4, 2, 1}, {-3, 4, 1, 2},
  };
  for (const Case& c : cases) {
    double re = 9, im = 9;
    EXPECT_EQ(ComplexSqrt(c.re, c.im, &re, &im), 0);
    EXPECT_NEAR(re, c.want_re, 1e-15 * (1 + std::fabs(c.want_re))) << c.re << " " << c.im;
    EXPECT_NEAR(im, c.want_im, 1e-15 * (1 + std::fabs(c.want_im))) << c.re << " " << c.im;
  }
  // Against the square: (sqrt z)^2 = z with a non-negative real part.
  std::mt19937_64 rng(3);
  std::normal_distribution<double> g;
  for (int i = 0; i < 200; ++i) {
    const std::complex<double> z(g(rng) * 10, g(rng) * 10);
    double re, im;
    ASSERT_EQ(ComplexSqrt(z.real(), z.imag(), &re, &im), 0);
    const std::complex<double> s(re, im);
    EXPECT_GE(re, 0.0);
    EXPECT_LT(std::abs(s * s - z), 1e-14 * std::abs(z));
  }
}

TEST(ComplexScalars, DivideCases) {
  struct Case {
    double a, b, c, d, want_re, want_im;
  };
  const std::vector<Case> cases = {
      {1, 0, 0, 1, 0, -1},
      {1, 1, 1, 1, 1, 0},
      {2, 4, 2, 0, 1, 2},
      {1, 2, 3, 4, 0.44, 0.08},
      {1e300, 1e300, 1e300, 1e300, 1, 0},  // no overflowing squares
  };
  for (const Case& c : cases) {
    double re = 9, im = 9;
    EXPECT_EQ(ComplexDivide(c.a, c.b, c.c, c.d, &re, &im), 0);
    EXPECT_NEAR(re, c.want_re, 1e-15);
    EXPECT_NEAR(im, c.want_im, 1e-15);
  }
  double re, im;
  ASSERT_EQ(ComplexDivide(1, 0, 0, 0, &re, &im), 0);  // unchecked: not finite
  EXPECT_FALSE(std::isfinite(re) && std::isfinite(im));
}

TEST(ComplexScalars, PolarCases) {
  double mag = 9, ang = 9;
  EXPECT_EQ(ComplexToPolar(0, 0, &mag, &ang), 0);
  EXPECT_EQ(mag, 0.0);
  EXPECT_EQ(ang, 0.0);
  ASSERT_EQ(ComplexToPolar(-1, 0, &mag, &ang), 0);
  EXPECT_EQ(mag, 1.0);
  EXPECT_DOUBLE_EQ(ang, std::numbers::pi);
  ASSERT_EQ(ComplexToPolar(3, -4, &mag, &ang), 0);
  EXPECT_DOUBLE_EQ(mag, 5.0);
  EXPECT_DOUBLE_EQ(ang, std::atan2(-4.0, 3.0));
  ASSERT_EQ(ComplexToPolar(0, 2, &mag, &ang), 0);
  EXPECT_DOUBLE_EQ(ang, std::numbers::pi / 2);
}

}  // namespace
