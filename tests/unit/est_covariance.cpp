// Covariance-method AR: known recursions, degenerate records, noise variance,
// the minimum-norm predictor of wide systems, argument codes and exhausted
// memory.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <random>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/work.h"
#include "support/ar_oracles.h"

namespace {

using ar_oracle::C;

struct Fit {
  StatusCode status = -1;
  std::vector<C> a;      // widened to complex for the real twin
  std::vector<C> poles;
  double variance = -1.0;
};

Fit FitReal(const std::vector<double>& x, int p) {
  Fit f;
  std::vector<double> a(p + 1, 77.0);
  f.poles.assign(p, C(77, 77));
  f.status = CovarianceArReal(x.data(), int32_t(x.size()), p, a.data(), f.poles.data(),
                              &f.variance);
  f.a.assign(a.begin(), a.end());
  return f;
}

Fit FitComplex(const std::vector<C>& x, int p) {
  Fit f;
  f.a.assign(p + 1, C(77, 77));
  f.poles.assign(p, C(77, 77));
  f.status = CovarianceArComplex(x.data(), int32_t(x.size()), p, f.a.data(), f.poles.data(),
                                 &f.variance);
  return f;
}

std::vector<double> RealParts(const std::vector<C>& v) {
  std::vector<double> out(v.size());
  for (size_t i = 0; i < v.size(); ++i) out[i] = v[i].real();
  return out;
}

// ---- exact recursions ---------------------------------------------------------

struct RecursionCase {
  const char* name;
  bool real;
  std::vector<C> poles;
  int n;
};

void PrintTo(const RecursionCase& c, std::ostream* os) { *os << c.name; }

class ExactRecursion : public ::testing::TestWithParam<RecursionCase> {};

TEST_P(ExactRecursion, RecoversCoefficientsPolesAndZeroVariance) {
  const RecursionCase& c = GetParam();
  const int p = int(c.poles.size());
  const std::vector<C> a_true = ar_oracle::MonicFromRoots(c.poles);
  Fit f;
  if (c.real) {
    std::vector<double> a_re = RealParts(a_true);
    std::vector<double> start = {1.0, -0.5, 0.25, 2.0, -1.0, 0.75};
    start.resize(p);
    f = FitReal(ar_oracle::ArRecord(a_re, start, c.n), p);
  } else {
    std::vector<C> start = {{1, 0.5}, {-0.5, 1}, {0.25, -2}, {2, 0}, {-1, -1}, {0.75, 0.3}};
    start.resize(p);
    f = FitComplex(ar_oracle::ArRecord(a_true, start, c.n), p);
  }
  ASSERT_EQ(f.status, 0);
  EXPECT_EQ(f.a[0], C(1, 0));
  EXPECT_LT(ar_oracle::RelativeError(f.a, a_true), 1e-9);
  EXPECT_LT(ar_oracle::MatchDistance(c.poles, f.poles), 1e-7);
  EXPECT_GE(f.variance, 0.0);
  EXPECT_LT(f.variance, 1e-20);
}

INSTANTIATE_TEST_SUITE_P(
    Covariance, ExactRecursion,
    ::testing::Values(
        RecursionCase{"RealDampedPairAndRealPole", true,
                      {std::polar(0.97, 0.6), std::polar(0.97, -0.6), C(0.8, 0)}, 40},
        RecursionCase{"RealTwoPairs", true,
                      {std::polar(0.99, 0.3), std::polar(0.99, -0.3), std::polar(0.9, 2.0),
                       std::polar(0.9, -2.0)},
                      48},
        RecursionCase{"RealNegativePole", true, {C(-0.9, 0), C(0.5, 0)}, 12},
        RecursionCase{"ComplexThreePoles", false,
                      {std::polar(0.95, 0.3), std::polar(0.7, -1.2), std::polar(0.99, 2.5)}, 30},
        RecursionCase{"ComplexUnitCircle", false, {std::polar(1.0, 1.0), std::polar(1.0, -0.4)},
                      20}),
    [](const auto& info) { return std::string(info.param.name); });

// ---- degenerate records -----------------------------------------------------------

TEST(Covariance, ConstantRealRecordOrderOneGivesUnitPole) {
  const Fit f = FitReal(std::vector<double>(10, 3.5), 1);
  ASSERT_EQ(f.status, 0);
  EXPECT_EQ(f.a[0], C(1, 0));
  EXPECT_NEAR(f.a[1].real(), -1.0, 1e-14);
  ASSERT_EQ(f.poles.size(), 1u);
  EXPECT_NEAR(f.poles[0].real(), 1.0, 1e-14);
  EXPECT_EQ(f.poles[0].imag(), 0.0);
  EXPECT_NEAR(f.variance, 0.0, 1e-28);
}

TEST(Covariance, ZeroRecordGivesTrivialPredictorAndZeroPoles) {
  for (int p : {1, 2, 5}) {
    const Fit fr = FitReal(std::vector<double>(12, 0.0), p);
    const Fit fc = FitComplex(std::vector<C>(12, C(0, 0)), p);
    for (const Fit* f : {&fr, &fc}) {
      ASSERT_EQ(f->status, 0) << p;
      EXPECT_EQ(f->a[0], C(1, 0));
      for (int k = 1; k <= p; ++k) EXPECT_EQ(f->a[k], C(0, 0)) << k;
      for (const C& z : f->poles) EXPECT_EQ(z, C(0, 0));
      EXPECT_EQ(f->variance, 0.0);
    }
  }
}

// ---- noise -----------------------------------------------------------------------

TEST(Covariance, WhiteNoiseVarianceMatchesGeneratingVariance) {
  const int n = 4000;
  const double sigma2 = 2.25;
  std::mt19937_64 rng(7);
  std::normal_distribution<double> g(0.0, 1.0);
  std::vector<double> xr(n);
  std::vector<C> xc(n);
  for (int t = 0; t < n; ++t) {
    xr[t] = std::sqrt(sigma2) * g(rng);
    const double re = g(rng);
    xc[t] = std::sqrt(sigma2 / 2) * C(re, g(rng));  // E|x|^2 = sigma2
  }
  for (int p : {1, 4, 10}) {
    const Fit fr = FitReal(xr, p);
    const Fit fc = FitComplex(xc, p);
    ASSERT_EQ(fr.status, 0);
    ASSERT_EQ(fc.status, 0);
    // the standard error of a variance estimate from 4000 samples is ~2.2%
    EXPECT_NEAR(fr.variance / sigma2, 1.0, 0.08) << p;
    EXPECT_NEAR(fc.variance / sigma2, 1.0, 0.08) << p;
    // a white record has no predictable part: small coefficients
    for (int k = 1; k <= p; ++k) {
      EXPECT_LT(std::abs(fr.a[k]), 0.1);
      EXPECT_LT(std::abs(fc.a[k]), 0.1);
    }
  }
}

// The variance is the mean squared residual of the returned predictor,
// recomputed here from the definition for a noisy AR(2) record.
TEST(Covariance, VarianceIsMeanSquaredResidualOfReturnedPredictor) {
  std::mt19937_64 rng(11);
  std::normal_distribution<double> g(0.0, 0.3);
  const int n = 200, p = 3;
  std::vector<C> x(n);
  for (int t = 0; t < n; ++t) {
    x[t] = C(g(rng), g(rng));
    if (t >= 2) x[t] += 1.6 * x[t - 1] - 0.8 * x[t - 2];
  }
  const Fit f = FitComplex(x, p);
  ASSERT_EQ(f.status, 0);
  // compare with an independent least-squares solve
  std::vector<C> A, b;
  ar_oracle::ForwardSystem(x, p, &A, &b);
  const std::vector<C> w = ar_oracle::TallSolve(A, n - p, p, b);
  for (int k = 1; k <= p; ++k) EXPECT_NEAR(std::abs(f.a[k] + w[k - 1]), 0.0, 1e-10);
  double sum = 0;
  for (int t = p; t < n; ++t) {
    C e = x[t];
    for (int k = 1; k <= p; ++k) e += f.a[k] * x[t - k];
    sum += std::norm(e);
  }
  EXPECT_NEAR(f.variance, sum / (n - p), 1e-12 * sum / (n - p));
}

// ---- wide systems: fewer equations than unknowns ---------------------------------

TEST(Covariance, OrderAboveHalfTheRecordGivesMinimumNormPredictor) {
  const int n = 64, p = 42;  // the largest accepted order: 22 equations, 42 unknowns
  ASSERT_EQ(p, 2 * n / 3);
  std::mt19937_64 rng(3);
  std::normal_distribution<double> g(0.0, 1.0);
  std::vector<C> xc(n);
  std::vector<C> xr_wide(n);
  std::vector<double> xr(n);
  for (int t = 0; t < n; ++t) {
    const double re = g(rng);
    xc[t] = C(re, g(rng));
    xr[t] = g(rng);
    xr_wide[t] = C(xr[t], 0);
  }
  for (bool real : {true, false}) {
    SCOPED_TRACE(real ? "real" : "complex");
    const std::vector<C>& x = real ? xr_wide : xc;
    const Fit f = real ? FitReal(xr, p) : FitComplex(xc, p);
    EXPECT_TRUE(f.status == 0) << f.status;  // the root finder copes with degree 42
    std::vector<C> A, b;
    ar_oracle::ForwardSystem(x, p, &A, &b);
    const std::vector<C> w = ar_oracle::MinNormSolve(A, n - p, p, b);
    std::vector<C> minus_a(f.a.begin() + 1, f.a.end());
    for (C& v : minus_a) v = -v;
    EXPECT_LT(ar_oracle::RelativeError(minus_a, w), 1e-8);
    EXPECT_GE(f.variance, 0.0);
    EXPECT_LT(f.variance, 1e-20);  // a wide system is fitted exactly
  }
}

// ---- twins -----------------------------------------------------------------------

TEST(Covariance, RealTwinMatchesComplexTwinOnRealInput) {
  std::mt19937_64 rng(5);
  std::normal_distribution<double> g(0.0, 0.1);
  const int n = 60;
  std::vector<double> xr(n);
  std::vector<C> xc(n);
  for (int t = 0; t < n; ++t) {
    xr[t] = std::cos(0.7 * t) * std::pow(0.98, t) + 0.5 * std::cos(2.1 * t + 0.4) + g(rng);
    xc[t] = C(xr[t], 0);
  }
  for (int p : {2, 4, 7}) {
    const Fit fr = FitReal(xr, p);
    const Fit fc = FitComplex(xc, p);
    ASSERT_EQ(fr.status, 0);
    ASSERT_EQ(fc.status, 0);
    EXPECT_LT(ar_oracle::RelativeError(fc.a, fr.a), 1e-10) << p;
    for (const C& v : fc.a) EXPECT_LT(std::abs(v.imag()), 1e-10);
    EXPECT_NEAR(fc.variance, fr.variance, 1e-10 * fr.variance);
    EXPECT_LT(ar_oracle::MatchDistance(fr.poles, fc.poles), 1e-7) << p;
  }
}

// ---- argument codes ---------------------------------------------------------------

struct ArgCase {
  int n, p;
  StatusCode want;
};

TEST(Covariance, ArgumentCodesAndTheLargestAcceptedOrder) {
  const ArgCase cases[] = {
      {0, 1, 1},  {-3, 1, 1},  {1, 1, 12},  {5, 0, 12},  {5, -2, 12},
      {5, 4, 12}, {9, 7, 12},  {9, 6, 0},   {3, 2, 0},   {64, 43, 12},
  };
  for (const ArgCase& c : cases) {
    std::vector<double> xr(std::max(c.n, 1), 1.0);
    std::vector<C> xc(std::max(c.n, 1), C(1, -1));
    for (int k = 0; k < std::max(c.n, 1); ++k) {
      xr[k] = std::cos(0.9 * k) + 0.1 * k;
      xc[k] = std::polar(1.0, 0.9 * k) + C(0.1 * k, 0);
    }
    const int slots = std::max(c.p, 0) + 1;
    std::vector<double> ar(slots);
    std::vector<C> ac(slots), r(slots);
    double v = 0;
    EXPECT_EQ(CovarianceArReal(xr.data(), c.n, c.p, ar.data(), r.data(), &v), c.want)
        << c.n << " " << c.p;
    EXPECT_EQ(CovarianceArComplex(xc.data(), c.n, c.p, ac.data(), r.data(), &v), c.want)
        << c.n << " " << c.p;
  }
}

}  // namespace
