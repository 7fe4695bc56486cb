// AR power spectra: the evaluators against a direct evaluation of the AR
// polynomial on the grid (no FFT), the small routines, and the drivers'
// argument checks and memory handling.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <cstdint>
#include <limits>
#include <type_traits>
#include <vector>

#include "estimation/estimation.h"
#include "support/ar_oracles.h"
#include "fft/fft.h"
#include "numeric/work.h"

namespace {

using C = std::complex<double>;
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();

struct Evaluated {
  StatusCode status;
  SpectrumResult result;
  std::vector<double> values;  // L values followed by guard entries
};

constexpr int kGuard = 4;
constexpr double kGuardValue = 12345.0;

Evaluated EvalComplex(std::vector<C> a, double fs, int32_t N, int32_t L, int32_t mode = 3) {
  Evaluated e{};
  e.values.assign(static_cast<size_t>(L) + kGuard, kGuardValue);
  e.result = {-7.0, -7.0, e.values.data()};
  e.status = ArSpectrumComplex(a.data(), static_cast<int32_t>(a.size()), 1, fs, N, mode,
                               &e.result);
  return e;
}

Evaluated EvalReal(std::vector<double> a, double fs, int32_t N, int32_t L, int32_t mode = 3) {
  Evaluated e{};
  e.values.assign(static_cast<size_t>(L) + kGuard, kGuardValue);
  e.result = {-7.0, -7.0, e.values.data()};
  e.status = ArSpectrumReal(a.data(), static_cast<int32_t>(a.size()), 1, fs, N, mode, &e.result);
  return e;
}

std::vector<double> RealParts(const std::vector<C>& a) {
  std::vector<double> r;
  for (const C& v : a) r.push_back(v.real());
  return r;
}

void ExpectMatchesOracle(const Evaluated& e, const std::vector<double>& oracle, double fs,
                         const std::string& what) {
  const int32_t L = static_cast<int32_t>(oracle.size());
  ASSERT_EQ(e.status, 0) << what;
  EXPECT_DOUBLE_EQ(e.result.f0, -fs / 2) << what;
  EXPECT_DOUBLE_EQ(e.result.df, fs / L) << what;
  double peak = -kInf;
  for (int32_t j = 0; j < L; ++j) {
    peak = std::max(peak, e.values[j]);
    EXPECT_LE(e.values[j], 1e-12) << what << " j=" << j;
    if (std::isfinite(oracle[j])) {
      EXPECT_NEAR(e.values[j], oracle[j], 1e-9) << what << " j=" << j;
    }
  }
  EXPECT_NEAR(peak, 0.0, 1e-12) << what;
  for (int g = 0; g < kGuard; ++g) EXPECT_EQ(e.values[L + g], kGuardValue) << what << ": wrote past L";
}

// ---------------------------------------------------------------------------
// Evaluators against the direct evaluation
// ---------------------------------------------------------------------------

struct Model {
  const char* name;
  std::vector<C> poles;
  bool real;  // conjugate-closed: the coefficients are real
};

std::vector<Model> Models() {
  const double r = 0.95, th = 2 * 3.141592653589793 * 0.2;
  return {
      {"AR(1)", {C(0.9, 0)}, true},
      {"AR(2) resonance", {std::polar(r, th), std::polar(r, -th)}, true},
      {"complex AR(4)",
       {std::polar(0.97, 0.6), std::polar(0.9, -2.1), std::polar(0.8, 2.8), C(-0.3, 0.2)},
       false},
  };
}

TEST(ArSpectrum, MatchesDirectEvaluationOfTheArPolynomial) {
  for (const Model& m : Models()) {
    const std::vector<C> a = ar_oracle::MonicFromRoots(m.poles);
    for (const double fs : {1.0, 1000.0, 44100.0}) {
      for (const int32_t L : {8, 64, 1024}) {
        const std::vector<double> oracle = ar_oracle::SpectrumDb(a, L);
        const std::string what = std::string(m.name) + " fs=" + std::to_string(fs) +
                                 " L=" + std::to_string(L);
        ExpectMatchesOracle(EvalComplex(a, fs, L, L), oracle, fs, what + " complex");
        if (m.real) ExpectMatchesOracle(EvalReal(RealParts(a), fs, L, L), oracle, fs, what + " real");
      }
    }
  }
}

TEST(ArSpectrum, RoundsTheRequestedSizeUpToAPowerOfTwo) {
  // AR(1): m = 2 fits every grid, down to L = 2.
  const std::vector<C> a = ar_oracle::MonicFromRoots(Models()[0].poles);
  const struct { int32_t N, L; } cases[] = {{2, 2}, {3, 4}, {5, 8}, {512, 512}, {513, 1024},
                                            {1000, 1024}, {1025, 2048}};
  for (const auto& c : cases) {
    const std::string what = "N=" + std::to_string(c.N);
    ExpectMatchesOracle(EvalComplex(a, 10.0, c.N, c.L), ar_oracle::SpectrumDb(a, c.L), 10.0, what);
    ExpectMatchesOracle(EvalReal(RealParts(a), 10.0, c.N, c.L), ar_oracle::SpectrumDb(a, c.L), 10.0, what);
  }
}

TEST(ArSpectrum, RealCoefficientsGiveASpectrumSymmetricAboutDc) {
  const std::vector<C> a = ar_oracle::MonicFromRoots({std::polar(0.9, 1.0), std::polar(0.9, -1.0),
                                        C(-0.5, 0), std::polar(0.7, 2.5), std::polar(0.7, -2.5)});
  const int32_t L = 256;
  const Evaluated real = EvalReal(RealParts(a), 2.0, L, L);
  const Evaluated cx = EvalComplex(a, 2.0, L, L);
  ASSERT_EQ(real.status, 0);
  ASSERT_EQ(cx.status, 0);
  for (int32_t j = 1; j < L / 2; ++j) {
    EXPECT_NEAR(real.values[L / 2 - j], real.values[L / 2 + j], 1e-12) << j;
    EXPECT_NEAR(cx.values[L / 2 - j], cx.values[L / 2 + j], 1e-9) << j;
  }
  // Index 0 is the Nyquist bin: the value at +fs/2 equals that at -fs/2.
  const std::vector<double> oracle = ar_oracle::SpectrumDb(a, L);
  EXPECT_NEAR(real.values[0], oracle[0], 1e-9);
  // Both evaluators agree on real coefficients.
  for (int32_t j = 0; j < L; ++j) EXPECT_NEAR(real.values[j], cx.values[j], 1e-9) << j;
}

TEST(ArSpectrum, CoefficientsLongerThanTheGridWrapByAssignment) {
  // m = 5 on L = 2: slot 0 ends holding a[4], slot 1 a[3].
  const std::vector<double> a = {1.0, 0.3, -0.2, 0.5, 2.0};
  ExpectMatchesOracle(EvalReal(a, 1.0, 2, 2), ar_oracle::SpectrumDb({C(2.0), C(0.5)}, 2), 1.0,
                      "real wrap");
  // Complex: m = 7 on L = 4: slots 0..3 hold a[4], a[5], a[6], a[3].
  const std::vector<C> ac = {C(1, 1), C(0.3, -2), C(-0.2, 0.1), C(0.5, 0.5),
                             C(2, -1), C(0.1, 0.4), C(-0.6, 0.2)};
  ExpectMatchesOracle(EvalComplex(ac, 1.0, 4, 4),
                      ar_oracle::SpectrumDb({ac[4], ac[5], ac[6], ac[3]}, 4), 1.0, "complex wrap");
}

TEST(ArSpectrum, NanSamplingRateGivesNanGridAndTheUsualValues) {
  const std::vector<C> a = ar_oracle::MonicFromRoots(Models()[2].poles);
  const Evaluated withNan = EvalComplex(a, kNaN, 64, 64);
  const Evaluated withOne = EvalComplex(a, 1.0, 64, 64);
  const Evaluated realNan = EvalReal({1.0, -0.5}, kNaN, 64, 64);
  ASSERT_EQ(withNan.status, 0);
  ASSERT_EQ(realNan.status, 0);
  EXPECT_TRUE(std::isnan(withNan.result.f0) && std::isnan(withNan.result.df));
  EXPECT_TRUE(std::isnan(realNan.result.f0) && std::isnan(realNan.result.df));
  for (int j = 0; j < 64; ++j) {
    EXPECT_TRUE(std::isfinite(withNan.values[j])) << j;
    EXPECT_TRUE(std::isfinite(realNan.values[j])) << j;
    EXPECT_EQ(withNan.values[j], withOne.values[j]) << j;
  }
}

TEST(ArSpectrum, ZeroOfTheArPolynomialOnTheGrid) {
  // A(z) = 1 - z^-1 vanishes at DC (index L/2): power 0, reciprocal +inf, peak
  // +inf, so NaN at that bin and 0 (-inf dB) everywhere else.
  const int32_t L = 16;
  const Evaluated cx = EvalComplex({C(1), C(-1)}, 1.0, L, L);
  const Evaluated re = EvalReal({1.0, -1.0}, 1.0, L, L);
  for (const Evaluated* e : {&cx, &re}) {
    ASSERT_EQ(e->status, 0);
    for (int32_t j = 0; j < L; ++j) {
      if (j == L / 2) EXPECT_TRUE(std::isnan(e->values[j]));
      else EXPECT_EQ(e->values[j], -kInf) << j;
    }
  }
}

TEST(ArSpectrum, WindowModes) {
  const std::vector<C> a = ar_oracle::MonicFromRoots(Models()[2].poles);
  // Modes outside 0..3 are refused by both evaluators.
  for (const int32_t mode : {-1, 4, 10}) {
    EXPECT_EQ(EvalComplex(a, 1.0, 16, 16, mode).status, status::kBadOption) << mode;
    EXPECT_EQ(EvalReal(RealParts(a), 1.0, 16, 16, mode).status, status::kBadOption) << mode;
  }
  // Mode 3 leaves the coefficients alone; modes 0, 1, 2 window them in place
  // with kinds 5, 1, 2, the complex ones part by part.
  const struct { int32_t mode, kind; } windows[] = {{3, -1}, {0, 5}, {1, 1}, {2, 2}};
  for (const auto& w : windows) {
    std::vector<double> re, im;
    for (const C& v : a) {
      re.push_back(v.real());
      im.push_back(v.imag());
    }
    const int32_t m = static_cast<int32_t>(a.size());
    if (w.kind >= 0) {
      ASSERT_EQ(ApplyWindow(re.data(), m, w.kind, 0), 0);
      ASSERT_EQ(ApplyWindow(im.data(), m, w.kind, 0), 0);
    }
    std::vector<C> ac = a;
    std::vector<double> ar = RealParts(a);
    std::vector<double> out(16);
    SpectrumResult r{0, 0, out.data()};
    ASSERT_EQ(ArSpectrumComplex(ac.data(), m, 1, 1.0, 16, w.mode, &r), 0);
    ASSERT_EQ(ArSpectrumReal(ar.data(), m, 1, 1.0, 16, w.mode, &r), 0);
    std::vector<C> windowed;
    for (int32_t i = 0; i < m; ++i) {
      EXPECT_EQ(ac[i], C(re[i], im[i])) << "mode " << w.mode << " i=" << i;
      EXPECT_EQ(ar[i], re[i]) << "mode " << w.mode << " i=" << i;
      windowed.emplace_back(re[i], im[i]);
    }
    // The spectrum is that of the windowed coefficients.
    ExpectMatchesOracle(EvalComplex(windowed, 1.0, 16, 16), ar_oracle::SpectrumDb(windowed, 16), 1.0,
                        "windowed");
    const std::vector<double> realOracle = ar_oracle::SpectrumDb(std::vector<C>(re.begin(), re.end()), 16);
    for (int j = 0; j < 16; ++j) EXPECT_NEAR(out[j], realOracle[j], 1e-9) << "mode " << w.mode;
  }
}

// ---------------------------------------------------------------------------
// Small routines
// ---------------------------------------------------------------------------

TEST(RotateReal, MovesEveryValueUpByTheShiftCircularly) {
  for (const int32_t L : {1, 2, 7, 16}) {
    for (int32_t s = 0; s <= L; ++s) {
      std::vector<double> x(L);
      for (int32_t i = 0; i < L; ++i) x[i] = 100.0 + i;
      ASSERT_EQ(RotateReal(x.data(), L, s), 0);
      for (int32_t j = 0; j < L; ++j) EXPECT_EQ(x[j], 100.0 + ((j - s) % L + L) % L) << L << " " << s;
    }
  }
}

TEST(NormalizeByPeak, ScalesByTheLargestMagnitude) {
  std::vector<double> in = {1.0, -4.0, kNaN, 2.0};
  std::vector<double> out(4, 99.0);
  double peak = 0;
  ASSERT_EQ(NormalizeByPeak(in.data(), 4, out.data(), &peak), 0);
  EXPECT_EQ(peak, 4.0);  // NaN never wins; the magnitude of a negative value does
  EXPECT_EQ(out[0], 0.25);
  EXPECT_EQ(out[1], -1.0);
  EXPECT_TRUE(std::isnan(out[2]));
  EXPECT_EQ(out[3], 0.5);
  EXPECT_EQ(in[1], -4.0);  // input untouched when out is given

  // Null out: in place.
  ASSERT_EQ(NormalizeByPeak(in.data(), 4, nullptr, &peak), 0);
  EXPECT_EQ(in[1], -1.0);

  // All zero (or NaN): copied unchanged, peak 0.
  std::vector<double> zeros = {0.0, kNaN, -0.0};
  std::vector<double> copy(3, 5.0);
  ASSERT_EQ(NormalizeByPeak(zeros.data(), 3, copy.data(), &peak), 0);
  EXPECT_EQ(peak, 0.0);
  EXPECT_EQ(copy[0], 0.0);
  EXPECT_TRUE(std::isnan(copy[1]));

  // Infinite peak: NaN at the peak, 0 elsewhere.
  std::vector<double> inf = {2.0, kInf, 3.0};
  ASSERT_EQ(NormalizeByPeak(inf.data(), 3, nullptr, &peak), 0);
  EXPECT_EQ(peak, kInf);
  EXPECT_EQ(inf[0], 0.0);
  EXPECT_TRUE(std::isnan(inf[1]));

  peak = 7.0;
  EXPECT_EQ(NormalizeByPeak(in.data(), 0, nullptr, &peak), status::kBadSize);
  EXPECT_EQ(peak, 7.0);
}

TEST(SelectRootsNearUnitCircle, OrdersByDistanceFromTheCircle) {
  const struct {
    const char* name;
    std::vector<C> z;
    int32_t k;
    std::vector<C> expected;
  } cases[] = {
      {"k = p - 1, distinct distances",
       {C(1.2, 0), C(0.99, 0), C(0, 0.5), C(-1, 0)}, 3,
       {C(-1, 0), C(0.99, 0), C(1.2, 0)}},
      // With k = p the last pick finds every distance equal to the largest one
      // (the chosen ones masked with it) and takes the lowest index again,
      // unless the farthest root is the first.
      {"k = p, farthest root not first",
       {C(1.2, 0), C(0.99, 0), C(0, 0.5), C(-1, 0)}, 4,
       {C(-1, 0), C(0.99, 0), C(1.2, 0), C(1.2, 0)}},
      {"k = p, farthest root first",
       {C(0, 0.5), C(0.99, 0), C(1.2, 0), C(-1, 0)}, 4,
       {C(-1, 0), C(0.99, 0), C(1.2, 0), C(0, 0.5)}},
      {"fewer than p", {C(0.5, 0), C(0, 1.05), C(0.3, -0.1)}, 1, {C(0, 1.05)}},
      {"tie below the largest distance: lower index first",
       {C(0.9, 0), C(1.1, 0), C(0.5, 0)}, 2, {C(0.9, 0), C(1.1, 0)}},
      {"tie at the largest distance: the first root twice",
       {C(0.5, 0), C(-0.5, 0)}, 2, {C(0.5, 0), C(0.5, 0)}},
      {"NaN root is never chosen", {C(kNaN, 0), C(0.8, 0)}, 1, {C(0.8, 0)}},
  };
  for (const auto& c : cases) {
    std::vector<C> out(c.k, C(77, 77));
    ASSERT_EQ(SelectRootsNearUnitCircle(c.z.data(), static_cast<int32_t>(c.z.size()), c.k,
                                        out.data()),
              0)
        << c.name;
    for (int32_t j = 0; j < c.k; ++j) EXPECT_EQ(out[j], c.expected[j]) << c.name << " j=" << j;
  }
}

// ---------------------------------------------------------------------------
// Drivers: argument checks (before any estimator runs)
// ---------------------------------------------------------------------------

TEST(PowerSpectrumDrivers, ArgumentChecksInOrder) {
  std::vector<double> xr(30, 1.0);
  std::vector<C> xc(30, C(1, 0));
  std::vector<double> values(64, kGuardValue);
  const struct { int32_t n, p, k, N; double fs; StatusCode cov, pcar; } cases[] = {
      {0, 2, 1, 16, 1.0, 1, 1},      // empty input first
      {0, -1, 0, 0, -1.0, 1, 1},
      {30, -1, 1, 16, 1.0, 11, 11},  // order negative
      {30, 21, 1, 16, 1.0, 11, 11},  // order above floor(2n/3) = 20
      {30, 21, 0, 0, 0.0, 11, 11},
      {30, 4, 0, 16, 1.0, -999, 12},   // k < 1 (PCAR only)
      {30, 4, 5, 16, 1.0, -999, 13},   // k > p
      {30, 4, 2, 1, 1.0, 17, 17},      // spectrum size below 2
      {30, 4, 2, -5, 1.0, 17, 17},
      {30, 4, 2, 16, 0.0, 18, 18},     // sampling rate not positive
      {30, 4, 2, 16, -1.0, 18, 18},
      {30, 4, 2, 16, -kInf, 18, 18},
  };
  for (const auto& c : cases) {
    SpectrumResult r{-7.0, -7.0, values.data()};
    double v = 0, amp[8], ph[8], fr[8], fit = 0;
    int32_t count = -3;
    if (c.cov != -999) {
      EXPECT_EQ(CovPowerSpectrumReal(xr.data(), c.n, c.p, c.N, c.fs, &r, &v), c.cov);
      EXPECT_EQ(CovPowerSpectrumComplex(xc.data(), c.n, c.p, c.N, c.fs, &r, &v), c.cov);
    }
    EXPECT_EQ(PcarPowerSpectrumReal(xr.data(), c.n, c.p, c.k, c.N, c.fs, 0, amp, ph, fr, &fit, &r,
                                    &count),
              c.pcar);
    EXPECT_EQ(PcarPowerSpectrumComplex(xc.data(), c.n, c.p, c.k, c.N, c.fs, amp, ph, fr, &fit, &r,
                                       &count),
              c.pcar);
    EXPECT_EQ(r.f0, -7.0);
    EXPECT_EQ(count, -3);
    EXPECT_EQ(values[0], kGuardValue);
  }
}

// A record of a few damped exponentials and a little deterministic noise.
template <typename T>
std::vector<T> Record(int n) {
  std::vector<T> x(n);
  uint64_t s = 12345;
  for (int t = 0; t < n; ++t) {
    s = s * 6364136223846793005ull + 1442695040888963407ull;
    const double noise = 1e-3 * (static_cast<double>(s >> 11) * 0x1.0p-53 - 0.5);
    const C v = std::polar(std::pow(0.98, t), 0.7 * t) + 0.5 * std::polar(std::pow(0.95, t), -1.9 * t);
    if constexpr (std::is_same_v<T, double>) x[t] = v.real() + noise;
    else x[t] = v + C(noise, -noise);
  }
  return x;
}

// ---------------------------------------------------------------------------
// Drivers on data
// ---------------------------------------------------------------------------

TEST(CovPowerSpectrum, IsTheSpectrumOfTheCovarianceModel) {
  const std::vector<C> xc = Record<C>(48);
  const std::vector<double> xr = Record<double>(48);
  for (const int32_t p : {1, 4, 8}) {
    std::vector<C> ac(p + 1);
    std::vector<double> ar(p + 1);
    std::vector<C> poles(p);
    double vModel = 0, vSpec = -1;
    ASSERT_EQ(CovarianceArComplex(xc.data(), 48, p, ac.data(), poles.data(), &vModel), 0);
    std::vector<double> values(128 + kGuard, kGuardValue);
    SpectrumResult r{0, 0, values.data()};
    ASSERT_EQ(CovPowerSpectrumComplex(xc.data(), 48, p, 100, 8.0, &r, &vSpec), 0);
    EXPECT_EQ(vSpec, vModel);
    ExpectMatchesOracle(Evaluated{0, r, values}, ar_oracle::SpectrumDb(ac, 128), 8.0, "complex p=" + std::to_string(p));

    ASSERT_EQ(CovarianceArReal(xr.data(), 48, p, ar.data(), poles.data(), &vModel), 0);
    std::fill(values.begin(), values.end(), kGuardValue);
    ASSERT_EQ(CovPowerSpectrumReal(xr.data(), 48, p, 100, 8.0, &r, &vSpec), 0);
    EXPECT_EQ(vSpec, vModel);
    ExpectMatchesOracle(Evaluated{0, r, values}, ar_oracle::SpectrumDb(std::vector<C>(ar.begin(), ar.end()), 128),
                        8.0, "real p=" + std::to_string(p));
  }
}

TEST(CovPowerSpectrum, OrderZeroIsLeftToTheCovarianceEstimator) {
  // The driver's own check lets p = 0 through; the covariance estimator
  // refuses it, and its status comes back unchanged.
  const std::vector<double> xr = Record<double>(20);
  const std::vector<C> xc = Record<C>(20);
  std::vector<double> values(16);
  SpectrumResult r{-7, -7, values.data()};
  double v = 0;
  C poles[1];
  double ar[1];
  C ac[1];
  EXPECT_EQ(CovPowerSpectrumReal(xr.data(), 20, 0, 16, 1.0, &r, &v),
            CovarianceArReal(xr.data(), 20, 0, ar, poles, &v));
  EXPECT_EQ(CovPowerSpectrumComplex(xc.data(), 20, 0, 16, 1.0, &r, &v),
            CovarianceArComplex(xc.data(), 20, 0, ac, poles, &v));
  EXPECT_EQ(CovPowerSpectrumReal(xr.data(), 20, 0, 16, 1.0, &r, &v), status::kBadCount);
  EXPECT_EQ(r.f0, -7);
}

TEST(PcarPowerSpectrum, IsTheSpectrumOfThePcarModelWithItsModes) {
  const std::vector<C> xc = Record<C>(48);
  const int32_t p = 8, k = 2;
  std::vector<C> a(p + 1), roots(p), selected(k), A(k);
  ASSERT_EQ(PcarEstimateComplex(xc.data(), 48, p, k, a.data(), roots.data()), 0);
  ASSERT_EQ(SelectRootsNearUnitCircle(roots.data(), p, k, selected.data()), 0);
  double E = 0;
  ASSERT_EQ(ModeAmplitudesComplex(xc.data(), 48, selected.data(), k, A.data(), &E), 0);

  std::vector<double> values(64 + kGuard, kGuardValue);
  SpectrumResult r{0, 0, values.data()};
  double amp[k], ph[k], fr[k], fit = -1;
  int32_t count = -1;
  ASSERT_EQ(PcarPowerSpectrumComplex(xc.data(), 48, p, k, 64, 5.0, amp, ph, fr, &fit, &r, &count),
            0);
  EXPECT_EQ(count, k);
  EXPECT_EQ(fit, E);
  for (int i = 0; i < k; ++i) {
    EXPECT_NEAR(amp[i], std::abs(A[i]), 1e-12);
    EXPECT_NEAR(ph[i], std::arg(A[i]), 1e-12);
    EXPECT_NEAR(fr[i], std::arg(selected[i]) * 5.0 / (2 * 3.141592653589793), 1e-12);
  }
  ExpectMatchesOracle(Evaluated{0, r, values}, ar_oracle::SpectrumDb(a, 64), 5.0, "pcar");
}

}  // namespace
