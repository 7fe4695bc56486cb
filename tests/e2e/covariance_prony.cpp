// Covariance AR and Prony through the exports, on host arrays whose elements
// sit at byte 4 of their blocks: known recursions and mode sums, output counts,
// argument codes with emptied outputs, and the 64-sample complex test record.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <limits>
#include <sstream>
#include <string>
#include <vector>

#include "support/ar_oracles.h"
#include "support/qdm_host.h"

namespace {

using ar_oracle::C;
constexpr double kPi = 3.14159265358979323846;

using qdmtest::HostArray;

const qdmtest::QdmApi& Lib() { return qdmtest::Qdm(); }

HostArray RealData(const std::vector<double>& x) { return HostArray::Real(x); }
HostArray ComplexData(const std::vector<C>& x) { return HostArray::Complex(x); }
// An output that already holds something, so emptying is visible.
HostArray Output(int32_t type) { return HostArray::Filled(type, 3, 7.0); }

struct CovOut {
  int32_t status = 1;
  std::vector<C> a, poles;
  int32_t a_count = -1, pole_count = -1;
  double variance = -1;
};

CovOut RunCov(const HostArray& data, int32_t p, bool complex) {
  HostArray a = Output(complex ? QDM_TYPE_COMPLEX : QDM_TYPE_DOUBLE);
  HostArray r = Output(QDM_TYPE_COMPLEX);
  CovOut o;
  o.status = complex ? Lib().QdmCxCovarianceH(data, p, a, r, &o.variance)
                     : Lib().QdmReCovarianceH(data, p, a, r, &o.variance);
  o.a_count = a.Count();
  o.pole_count = r.Count();
  if (complex) {
    o.a = a.Complexes();
  } else {
    for (double v : a.Reals()) o.a.emplace_back(v, 0.0);
  }
  o.poles = r.Complexes();
  return o;
}

struct Mode {
  double amp, phase, damp, freq;
};
struct PronyOut {
  int32_t status = 1;
  int32_t counts[4] = {-1, -1, -1, -1};
  std::vector<Mode> modes;
};

PronyOut RunProny(const HostArray& data, int32_t p, double fs, const uint8_t* flag) {
  HostArray out[4] = {Output(QDM_TYPE_DOUBLE), Output(QDM_TYPE_DOUBLE), Output(QDM_TYPE_DOUBLE),
                   Output(QDM_TYPE_DOUBLE)};
  PronyOut o;
  o.status = flag != nullptr
                 ? Lib().QdmRePronyH(data, p, fs, flag, out[0], out[1], out[2], out[3])
                 : Lib().QdmCxPronyH(data, p, fs, out[0], out[1], out[2], out[3]);
  for (int i = 0; i < 4; ++i) o.counts[i] = out[i].Count();
  const std::vector<double> amp = out[0].Reals(), phase = out[1].Reals(),
                            damp = out[2].Reals(), freq = out[3].Reals();
  for (size_t i = 0; i < amp.size() && i < freq.size(); ++i) {
    o.modes.push_back({amp[i], phase[i], damp[i], freq[i]});
  }
  return o;
}

C Pole(const Mode& m, double fs) { return std::exp(C(m.damp, 2 * kPi * m.freq / fs)); }

// Each expected mode against the reported one of nearest pole, all four
// parameters to a relative (near zero, absolute) 1e-8.
void ExpectModes(const std::vector<Mode>& want, const PronyOut& got, double fs) {
  ASSERT_EQ(got.status, 0);
  for (int i = 0; i < 4; ++i) ASSERT_EQ(got.counts[i], int32_t(want.size()));
  std::vector<bool> used(got.modes.size(), false);
  for (const Mode& w : want) {
    size_t best = got.modes.size();
    for (size_t j = 0; j < got.modes.size(); ++j) {
      if (used[j]) continue;
      if (best == got.modes.size() || std::abs(Pole(got.modes[j], fs) - Pole(w, fs)) <
                                          std::abs(Pole(got.modes[best], fs) - Pole(w, fs))) {
        best = j;
      }
    }
    ASSERT_LT(best, got.modes.size());
    used[best] = true;
    const Mode& g = got.modes[best];
    const double tol = 1e-8;
    EXPECT_NEAR(g.amp, w.amp, tol * std::max(1.0, std::abs(w.amp)));
    EXPECT_NEAR(g.phase, w.phase, tol * std::max(1.0, std::abs(w.phase)));
    EXPECT_NEAR(g.damp, w.damp, tol * std::max(1.0, std::abs(w.damp)));
    EXPECT_NEAR(g.freq, w.freq, tol * std::max(1.0, std::abs(w.freq)));
  }
}

std::vector<C> Synthesize(const std::vector<Mode>& modes, double fs, int n) {
  std::vector<C> x(n);
  for (const Mode& m : modes) {
    const C A = std::polar(m.amp, m.phase);
    const C z = Pole(m, fs);
    C zt(1, 0);
    for (int t = 0; t < n; ++t, zt *= z) x[t] += A * zt;
  }
  return x;
}

std::vector<C> Marple() {
  // tests/e2e/this file -> tests/data/marple64.csv
  const std::filesystem::path path =
      std::filesystem::path(__FILE__).parent_path().parent_path() / "data" / "marple64.csv";
  std::ifstream in(path);
  std::vector<C> x;
  std::string line;
  while (std::getline(in, line)) {
    std::istringstream row(line);
    double re = 0, im = 0;
    char comma = 0;
    if (row >> re >> comma >> im) x.emplace_back(re, im);
  }
  return x;
}

class CovariancePronyE2e : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_NE(Lib().module, nullptr);
    // the library must cope with host elements that are not 8-aligned
    ASSERT_EQ(HostArray::Real({1.0}).ElementAddress() % 8, 4u);
  }
};

// ---- covariance ------------------------------------------------------------------------

TEST_F(CovariancePronyE2e, CovarianceRecoversExactRecursionsWithTheirCounts) {
  const std::vector<C> real_poles = {std::polar(0.97, 0.6), std::polar(0.97, -0.6), C(0.8, 0)};
  const std::vector<C> cx_poles = {std::polar(0.95, 0.3), std::polar(0.7, -1.2),
                                   std::polar(0.99, 2.5), C(-0.6, 0.1)};
  {
    const std::vector<C> a_true = ar_oracle::MonicFromRoots(real_poles);
    std::vector<double> a_re;
    for (const C& v : a_true) a_re.push_back(v.real());
    const HostArray data = RealData(ar_oracle::ArRecord(a_re, {1.0, -0.5, 0.25}, 40));
    const CovOut o = RunCov(data, 3, false);
    ASSERT_EQ(o.status, 0);
    EXPECT_EQ(o.a_count, 4);
    EXPECT_EQ(o.pole_count, 3);
    EXPECT_LT(ar_oracle::RelativeError(o.a, a_true), 1e-9);
    EXPECT_LT(ar_oracle::MatchDistance(real_poles, o.poles), 1e-7);
    EXPECT_NEAR(o.variance, 0.0, 1e-20);
  }
  {
    const std::vector<C> a_true = ar_oracle::MonicFromRoots(cx_poles);
    const HostArray data =
        ComplexData(ar_oracle::ArRecord(a_true, {{1, 0.5}, {-0.5, 1}, {0.25, -2}, {2, 0}}, 33));
    const CovOut o = RunCov(data, 4, true);
    ASSERT_EQ(o.status, 0);
    EXPECT_EQ(o.a_count, 5);
    EXPECT_EQ(o.pole_count, 4);
    EXPECT_EQ(o.a[0], C(1, 0));
    EXPECT_LT(ar_oracle::RelativeError(o.a, a_true), 1e-9);
    EXPECT_LT(ar_oracle::MatchDistance(cx_poles, o.poles), 1e-7);
    EXPECT_NEAR(o.variance, 0.0, 1e-20);
  }
}

TEST_F(CovariancePronyE2e, CovarianceDegenerateRecords) {
  const CovOut constant = RunCov(RealData(std::vector<double>(9, -2.0)), 1, false);
  ASSERT_EQ(constant.status, 0);
  EXPECT_NEAR(constant.a[1].real(), -1.0, 1e-14);
  ASSERT_EQ(constant.poles.size(), 1u);
  EXPECT_NEAR(std::abs(constant.poles[0] - C(1, 0)), 0.0, 1e-14);
  EXPECT_NEAR(constant.variance, 0.0, 1e-28);

  for (bool complex : {false, true}) {
    const HostArray data = complex ? ComplexData(std::vector<C>(15)) : RealData(std::vector<double>(15));
    const CovOut zeros = RunCov(data, 4, complex);
    ASSERT_EQ(zeros.status, 0);
    ASSERT_EQ(zeros.a.size(), 5u);
    EXPECT_EQ(zeros.a[0], C(1, 0));
    for (int k = 1; k <= 4; ++k) EXPECT_EQ(zeros.a[k], C(0, 0));
    for (const C& z : zeros.poles) EXPECT_EQ(z, C(0, 0));
    EXPECT_EQ(zeros.variance, 0.0);
  }
}

TEST_F(CovariancePronyE2e, CovarianceWideSystemGivesMinimumNormPredictor) {
  const int n = 64, p = 42;
  std::vector<C> x(n);
  for (int t = 0; t < n; ++t) x[t] = C(std::sin(1.3 * t * t + 0.2), std::cos(0.7 * t * t + 1));
  const CovOut o = RunCov(ComplexData(x), p, true);
  ASSERT_EQ(o.status, 0);
  std::vector<C> A, b;
  ar_oracle::ForwardSystem(x, p, &A, &b);
  std::vector<C> w = ar_oracle::MinNormSolve(A, n - p, p, b);
  std::vector<C> minus_a(o.a.begin() + 1, o.a.end());
  for (C& v : minus_a) v = -v;
  EXPECT_LT(ar_oracle::RelativeError(minus_a, w), 1e-8);
  EXPECT_GE(o.variance, 0.0);
}

struct BadCall {
  int n;
  int32_t p;
  double fs;
  int32_t host_status;
};

TEST_F(CovariancePronyE2e, ArgumentErrorsEmptyEveryOutput) {
  const BadCall cases[] = {
      {0, 2, 1.0, -42401}, {6, 0, 1.0, -42412},  {6, -1, 1.0, -42412},
      {6, 5, 1.0, -42412}, {1, 1, 1.0, -42412},  {6, 4, 0.0, -42418},
      {6, 4, -3.0, -42418},
  };
  for (const BadCall& c : cases) {
    SCOPED_TRACE(::testing::Message() << "n=" << c.n << " p=" << c.p << " fs=" << c.fs);
    std::vector<double> xr(c.n);
    std::vector<C> xc(c.n);
    for (int t = 0; t < c.n; ++t) {
      xr[t] = std::cos(0.8 * t) + 0.1 * t;
      xc[t] = std::polar(1.0, 0.8 * t) + 0.1 * t;
    }
    const HostArray re = RealData(xr), cx = ComplexData(xc);
    if (c.host_status != -42418) {  // the covariance exports take no rate
      for (bool complex : {false, true}) {
        const CovOut o = RunCov(complex ? cx : re, c.p, complex);
        EXPECT_EQ(o.status, c.host_status);
        EXPECT_EQ(o.a_count, 0);
        EXPECT_EQ(o.pole_count, 0);
        EXPECT_EQ(o.variance, 0.0);
      }
    }
    const uint8_t flag = 1;
    for (const uint8_t* f : {&flag, static_cast<const uint8_t*>(nullptr)}) {
      const PronyOut o = RunProny(f ? re : cx, c.p, c.fs, f);
      EXPECT_EQ(o.status, c.host_status);
      for (int i = 0; i < 4; ++i) EXPECT_EQ(o.counts[i], 0);
    }
  }
  // The largest accepted order and a NaN rate both pass.
  std::vector<double> x(9);
  for (int t = 0; t < 9; ++t) x[t] = std::cos(0.8 * t) + 0.1 * t;
  const uint8_t off = 0;
  EXPECT_EQ(RunCov(RealData(x), 6, false).status, 0);
  EXPECT_EQ(RunProny(RealData(x), 6, 1.0, &off).status, 0);
  const PronyOut nan_rate =
      RunProny(RealData(x), 2, std::numeric_limits<double>::quiet_NaN(), &off);
  EXPECT_EQ(nan_rate.status, 0);
  EXPECT_EQ(nan_rate.counts[0], 2);
}

// ---- Prony -----------------------------------------------------------------------------

TEST_F(CovariancePronyE2e, PronyRecoversComplexModeSum) {
  const double fs = 250.0;
  const std::vector<Mode> modes = {
      {1.0, 0.3, -0.01, 20.0}, {0.5, -2.0, -0.05, -55.0}, {2.0, 1.2, 0.0, 87.5}};
  ExpectModes(modes, RunProny(ComplexData(Synthesize(modes, fs, 24)), 3, fs, nullptr), fs);
}

TEST_F(CovariancePronyE2e, PronyRealSinusoidWithAndWithoutTheRealSignalFlag) {
  const double fs = 48000.0, f = 1000.0, phi = -0.9;
  std::vector<double> x(48);
  for (int t = 0; t < 48; ++t) x[t] = 0.6 * std::cos(2 * kPi * f * t / fs + phi);
  const HostArray data = RealData(x);
  const uint8_t on = 1, off = 0;
  ExpectModes({{0.3, phi, 0.0, f}}, RunProny(data, 2, fs, &on), fs);
  ExpectModes({{0.3, phi, 0.0, f}, {0.3, -phi, 0.0, -f}}, RunProny(data, 2, fs, &off), fs);
}

// ---- the 64-sample complex test record --------------------------------------------------

TEST_F(CovariancePronyE2e, TestRecordCovarianceMatchesIndependentLeastSquares) {
  const std::vector<C> x = Marple();
  ASSERT_EQ(x.size(), 64u);
  std::vector<double> re(x.size());
  std::vector<C> re_c(x.size());
  for (size_t t = 0; t < x.size(); ++t) {
    re[t] = x[t].real();
    re_c[t] = C(re[t], 0);
  }
  for (int p : {2, 4, 8, 15}) {
    SCOPED_TRACE(p);
    for (bool complex : {true, false}) {
      const std::vector<C>& rec = complex ? x : re_c;
      const CovOut o = RunCov(complex ? ComplexData(x) : RealData(re), p, complex);
      ASSERT_EQ(o.status, 0);
      ASSERT_EQ(o.a_count, p + 1);
      ASSERT_EQ(o.pole_count, p);
      std::vector<C> A, b;
      ar_oracle::ForwardSystem(rec, p, &A, &b);
      const std::vector<C> w = ar_oracle::TallSolve(A, 64 - p, p, b);
      std::vector<C> minus_a(o.a.begin() + 1, o.a.end());
      for (C& v : minus_a) v = -v;
      EXPECT_LT(ar_oracle::RelativeError(minus_a, w), 1e-9);
      double sum = 0;
      for (int t = p; t < 64; ++t) {
        C e = rec[t];
        for (int k = 1; k <= p; ++k) e += o.a[k] * rec[t - k];
        sum += std::norm(e);
      }
      EXPECT_GT(o.variance, 0.0);
      EXPECT_NEAR(o.variance, sum / (64 - p), 1e-10 * o.variance);
      // the poles are the roots of the returned polynomial
      for (const C& z : o.poles) {
        C v = 0;
        for (const C& a : o.a) v = v * z + a;
        double scale = 0;
        for (const C& a : o.a) scale = scale * std::abs(z) + std::abs(a);
        EXPECT_LT(std::abs(v), 1e-9 * scale);
        EXPECT_LT(std::abs(z), 1.2);  // a stable-ish fit of a stationary record
      }
    }
  }
}

TEST_F(CovariancePronyE2e, TestRecordPronyModesRebuildTheRecordAndShareTheCovariancePoles) {
  const std::vector<C> x = Marple();
  ASSERT_EQ(x.size(), 64u);
  const double fs = 1.0;
  double power = 0;
  for (const C& v : x) power += std::norm(v);
  power /= 64;
  for (int p : {4, 10, 20}) {
    SCOPED_TRACE(p);
    const PronyOut pr = RunProny(ComplexData(x), p, fs, nullptr);
    ASSERT_EQ(pr.status, 0);
    for (int i = 0; i < 4; ++i) ASSERT_EQ(pr.counts[i], p);
    const CovOut cov = RunCov(ComplexData(x), p, true);
    ASSERT_EQ(cov.status, 0);
    std::vector<C> prony_poles;
    for (const Mode& m : pr.modes) prony_poles.push_back(Pole(m, fs));
    EXPECT_LT(ar_oracle::MatchDistance(cov.poles, prony_poles), 1e-9);
    // the modes rebuild the record better than nothing, and better with more modes
    double err = 0;
    const std::vector<C> model = Synthesize(pr.modes, fs, 64);
    for (int t = 0; t < 64; ++t) err += std::norm(model[t] - x[t]);
    err /= 64;
    EXPECT_LT(err, 0.5 * power);
  }
}

}  // namespace
