// Prony: noise-free sums of damped exponentials come back mode for mode; the
// real-signal flag halves a conjugate pair; the twins agree on real input;
// argument codes; exhausted memory.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <limits>
#include <random>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/work.h"

namespace {

using C = std::complex<double>;
constexpr double kPi = 3.14159265358979323846;

struct Mode {
  double amp, phase, damp, freq;  // as reported: |A|, arg A, ln|z|, arg z * fs / 2pi
};

struct Result {
  StatusCode status = -1;
  int32_t count = -1;
  std::vector<Mode> modes;
};

Result Collect(StatusCode st, int32_t count, const std::vector<double>& amp,
               const std::vector<double>& phase, const std::vector<double>& damp,
               const std::vector<double>& freq) {
  Result r;
  r.status = st;
  r.count = count;
  for (int32_t i = 0; st == 0 && i < count; ++i) r.modes.push_back({amp[i], phase[i], damp[i], freq[i]});
  return r;
}

Result RunComplex(const std::vector<C>& x, int p, double fs, int n = -1) {
  const size_t k = size_t(std::max(p, 1));
  std::vector<double> amp(k), phase(k), damp(k), freq(k);
  int32_t count = -1;
  const StatusCode st = PronyComplex(x.data(), n < 0 ? int32_t(x.size()) : n, p, fs, amp.data(),
                                     phase.data(), damp.data(), freq.data(), &count);
  return Collect(st, count, amp, phase, damp, freq);
}

Result RunReal(const std::vector<double>& x, int p, double fs, int32_t flag, int n = -1) {
  const size_t k = size_t(std::max(p, 1));
  std::vector<double> amp(k), phase(k), damp(k), freq(k);
  int32_t count = -1;
  const StatusCode st = PronyReal(x.data(), n < 0 ? int32_t(x.size()) : n, p, fs, flag, amp.data(),
                                  phase.data(), damp.data(), freq.data(), &count);
  return Collect(st, count, amp, phase, damp, freq);
}

C Pole(const Mode& m, double fs) { return std::exp(C(m.damp, 2 * kPi * m.freq / fs)); }

// Pairs each expected mode with the reported mode of nearest pole. With
// `parameters` all four reported values must agree to a relative (near zero,
// absolute) 1e-8; otherwise the poles and complex amplitudes must, which
// sidesteps the +-pi ambiguity of a phase or frequency on the negative axis.
void ExpectModes(const std::vector<Mode>& want, const Result& got, double fs,
                 bool parameters = true) {
  ASSERT_EQ(got.status, 0);
  ASSERT_EQ(size_t(got.count), want.size());
  std::vector<bool> used(want.size(), false);
  for (const Mode& w : want) {
    const C zw = Pole(w, fs);
    size_t best = want.size();
    for (size_t j = 0; j < got.modes.size(); ++j) {
      if (used[j]) continue;
      if (best == want.size() ||
          std::abs(Pole(got.modes[j], fs) - zw) < std::abs(Pole(got.modes[best], fs) - zw)) {
        best = j;
      }
    }
    ASSERT_LT(best, want.size());
    used[best] = true;
    const Mode& g = got.modes[best];
    auto close = [](double a, double b) {
      return std::abs(a - b) <= 1e-8 * std::max(1.0, std::abs(b));
    };
    if (parameters) {
      EXPECT_TRUE(close(g.amp, w.amp)) << g.amp << " vs " << w.amp;
      EXPECT_TRUE(close(g.phase, w.phase)) << g.phase << " vs " << w.phase;
      EXPECT_TRUE(close(g.damp, w.damp)) << g.damp << " vs " << w.damp;
      EXPECT_TRUE(close(g.freq, w.freq)) << g.freq << " vs " << w.freq;
    } else {
      EXPECT_LT(std::abs(Pole(g, fs) - zw), 1e-8 * std::abs(zw));
      EXPECT_LT(std::abs(std::polar(g.amp, g.phase) - std::polar(w.amp, w.phase)),
                1e-8 * std::max(1.0, w.amp));
    }
  }
}

std::vector<C> Synthesize(const std::vector<Mode>& modes, double fs, int n) {
  std::vector<C> x(n);
  for (const Mode& m : modes) {
    const C A = std::polar(m.amp, m.phase);
    const C z = std::exp(C(m.damp, 2 * kPi * m.freq / fs));
    C zt(1, 0);
    for (int t = 0; t < n; ++t, zt *= z) x[t] += A * zt;
  }
  return x;
}

// ---- noise-free mode sums ----------------------------------------------------------

TEST(Prony, ComplexModeSumIsRecoveredModeForMode) {
  const double fs = 500.0;
  const std::vector<Mode> modes = {{1.0, 0.3, -0.01, 40.0},
                                   {0.5, -2.0, -0.05, -110.0},
                                   {2.0, 1.2, 0.0, 175.0},
                                   {0.8, 3.0, -0.02, 5.0}};
  for (int n : {12, 40}) {
    SCOPED_TRACE(n);
    ExpectModes(modes, RunComplex(Synthesize(modes, fs, n), 4, fs), fs);
  }
}

TEST(Prony, RealDampedCosinesWithTheRealFlagReportPositiveFrequencyHalves) {
  const double fs = 8000.0;
  // 2 a e^{d t} cos(w t + phi) = A z^t + conj(A z^t) with |A| = a
  const std::vector<Mode> halves = {{1.5, 0.4, -0.003, 440.0}, {0.25, -1.1, -0.02, 1900.0}};
  std::vector<Mode> both = halves;
  for (const Mode& m : halves) both.push_back({m.amp, -m.phase, m.damp, -m.freq});
  const int n = 50;
  const std::vector<C> xc = Synthesize(both, fs, n);
  std::vector<double> x(n);
  for (int t = 0; t < n; ++t) x[t] = xc[t].real();
  ExpectModes(halves, RunReal(x, 4, fs, 1), fs);
  ExpectModes(both, RunReal(x, 4, fs, 0), fs);
}

TEST(Prony, UndampedSinusoidGivesOneModeWithFlagAndTwoWithout) {
  const double fs = 1.0, f = 0.125, phi = 0.7;
  std::vector<double> x(30);
  for (int t = 0; t < 30; ++t) x[t] = 3.0 * std::cos(2 * kPi * f * t + phi);
  for (int32_t flag : {1, 255}) {
    const Result r = RunReal(x, 2, fs, flag);
    ExpectModes({{1.5, phi, 0.0, f}}, r, fs);
  }
  const Result both = RunReal(x, 2, fs, 0);
  ExpectModes({{1.5, phi, 0.0, f}, {1.5, -phi, 0.0, -f}}, both, fs);
}

TEST(Prony, RealTwinMatchesComplexTwinOnRealInput) {
  std::mt19937_64 rng(9);
  std::normal_distribution<double> g(0.0, 0.05);
  const int n = 45;
  std::vector<double> x(n);
  std::vector<C> xc(n);
  for (int t = 0; t < n; ++t) {
    x[t] = std::pow(0.97, t) * std::cos(0.9 * t + 0.2) + 0.4 * std::cos(2.3 * t) + g(rng);
    xc[t] = C(x[t], 0);
  }
  for (int p : {3, 4, 6}) {
    const Result r = RunReal(x, p, 100.0, 0);
    const Result c = RunComplex(xc, p, 100.0);
    ASSERT_EQ(r.status, 0);
    ASSERT_EQ(c.status, 0);
    ASSERT_EQ(r.count, p);
    ASSERT_EQ(c.count, p);
    // the same modes, possibly found in another order
    ExpectModes(r.modes, c, 100.0, false);
  }
}

TEST(Prony, ModesFollowRootFinderOrderUnsorted) {
  // Mode order is whatever the poles' order is; the reported frequencies are
  // not sorted. Check only that the count equals p and each frequency is one
  // of the synthesized ones.
  const double fs = 10.0;
  const std::vector<Mode> modes = {{1, 0, 0, 3.0}, {1, 0, 0, -1.0}, {1, 0, 0, 2.0}};
  const Result r = RunComplex(Synthesize(modes, fs, 20), 3, fs);
  ASSERT_EQ(r.status, 0);
  ASSERT_EQ(r.count, 3);
  ExpectModes(modes, r, fs);
}

// ---- argument codes ---------------------------------------------------------------

TEST(Prony, ArgumentCodesInOrder) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  struct Case {
    int n, p;
    double fs;
    StatusCode want;
  } cases[] = {
      {0, 0, -1.0, 1}, {1, 1, 1.0, 12},  {6, 0, -1.0, 12}, {6, -1, 1.0, 12},
      {6, 5, 1.0, 12}, {6, 4, 0.0, 18},  {6, 4, -2.0, 18}, {6, 4, 1.0, 0},
      {6, 4, -0.0, 18},
  };
  for (const Case& c : cases) {
    std::vector<double> x(std::max(c.n, 1));
    std::vector<C> xc(x.size());
    for (size_t t = 0; t < x.size(); ++t) {
      x[t] = std::cos(0.7 * double(t)) + 0.2 * double(t);
      xc[t] = std::polar(1.0, 0.7 * double(t)) + C(0.2 * double(t), 0);
    }
    EXPECT_EQ(RunReal(x, c.p, c.fs, 0, c.n).status, c.want) << c.n << " " << c.p << " " << c.fs;
    EXPECT_EQ(RunComplex(xc, c.p, c.fs, c.n).status, c.want) << c.n << " " << c.p << " " << c.fs;
  }
  // A NaN rate passes the check and yields NaN frequencies.
  std::vector<C> xc(9);
  for (int t = 0; t < 9; ++t) xc[t] = std::polar(1.0, 0.7 * t);
  const Result r = RunComplex(xc, 2, nan);
  ASSERT_EQ(r.status, 0);
  for (const Mode& m : r.modes) EXPECT_TRUE(std::isnan(m.freq));
}

// ---- exhausted memory --------------------------------------------------------------

}  // namespace
