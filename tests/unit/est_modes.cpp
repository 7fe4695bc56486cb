// Exponential modes: amplitude fits against records built from known modes,
// the fitting error against hand-computed residuals, and the conversion to
// amplitude/phase/damping/frequency including its edge poles.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <limits>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/work.h"

namespace {

using C = std::complex<double>;
constexpr double kPi = 3.14159265358979323846;

std::vector<C> ModeSum(const std::vector<C>& amps, const std::vector<C>& poles, int n) {
  std::vector<C> x(n);
  for (int t = 0; t < n; ++t) {
    for (size_t i = 0; i < amps.size(); ++i) x[t] += amps[i] * std::pow(poles[i], t);
  }
  return x;
}

TEST(ModeAmplitudes, ComplexFitRecoversAmplitudesOfExactModeSum) {
  const std::vector<C> poles = {std::polar(0.97, 0.4), std::polar(1.0, -1.3),
                                std::polar(0.9, 2.9)};
  const std::vector<C> amps = {C(1.5, -0.5), C(0.2, 0.7), C(-2.0, 0.1)};
  for (int n : {3, 8, 50}) {
    const std::vector<C> x = ModeSum(amps, poles, n);
    std::vector<C> A(3);
    double E = -1;
    ASSERT_EQ(ModeAmplitudesComplex(x.data(), n, poles.data(), 3, A.data(), &E), 0);
    for (int i = 0; i < 3; ++i) EXPECT_LT(std::abs(A[i] - amps[i]), 1e-10) << n << " " << i;
    EXPECT_GE(E, 0.0);
    EXPECT_LT(E, 1e-24);
  }
}

TEST(ModeAmplitudes, RealFitSplitsADampedCosineIntoConjugateAmplitudes) {
  // 3 * 0.95^t cos(0.8 t + 0.6) = A z^t + conj(A) conj(z)^t with A = 1.5 e^{0.6i}
  const int n = 40;
  const C z = std::polar(0.95, 0.8);
  std::vector<double> x(n);
  for (int t = 0; t < n; ++t) x[t] = 3.0 * std::pow(0.95, t) * std::cos(0.8 * t + 0.6);
  const std::vector<C> poles = {z, std::conj(z)};
  std::vector<C> A(2);
  double E = -1;
  ASSERT_EQ(ModeAmplitudesReal(x.data(), n, poles.data(), 2, A.data(), &E), 0);
  EXPECT_LT(std::abs(A[0] - std::polar(1.5, 0.6)), 1e-10);
  EXPECT_LT(std::abs(A[1] - std::polar(1.5, -0.6)), 1e-10);
  EXPECT_LT(E, 1e-24);
}

TEST(ModeAmplitudes, FittingErrorIsMeanSquaredResidual) {
  // An alternating record against the single pole 1: the best amplitude is the
  // mean, and every residual is the deviation from it.
  const std::vector<double> xr = {1, -1, 1, -1, 1};
  const std::vector<C> xc = {{1, 2}, {-1, 2}, {1, 2}, {-1, 2}};
  const C pole(1, 0);
  C A;
  double E = -1;
  ASSERT_EQ(ModeAmplitudesReal(xr.data(), 5, &pole, 1, &A, &E), 0);
  EXPECT_NEAR(A.real(), 0.2, 1e-14);
  EXPECT_NEAR(A.imag(), 0.0, 1e-14);
  EXPECT_NEAR(E, (3 * 0.64 + 2 * 1.44) / 5, 1e-14);
  ASSERT_EQ(ModeAmplitudesComplex(xc.data(), 4, &pole, 1, &A, &E), 0);
  EXPECT_LT(std::abs(A - C(0, 2)), 1e-14);
  EXPECT_NEAR(E, 1.0, 1e-14);
}

TEST(ModeAmplitudes, SingleSampleSeesOneRowOfOnes) {
  // With n = 1 every pole contributes z^0 = 1: the minimum-norm amplitudes
  // share the sample equally, whatever the poles are.
  const C x(3.0, -6.0);
  const std::vector<C> poles = {C(5, 5), C(0, 0), C(-0.2, 0.1)};
  std::vector<C> A(3);
  double E = -1;
  ASSERT_EQ(ModeAmplitudesComplex(&x, 1, poles.data(), 3, A.data(), &E), 0);
  for (const C& a : A) EXPECT_LT(std::abs(a - x / 3.0), 1e-14);
  EXPECT_LT(E, 1e-28);
}

TEST(ModeAmplitudes, ComplexFormChecksArgumentsInOrder) {
  const C x[2] = {{1, 0}, {2, 0}};
  const C z[1] = {{1, 0}};
  C A[1] = {{9, 9}};
  double E = 9;
  EXPECT_EQ(ModeAmplitudesComplex(x, 0, z, 1, A, &E), 1);
  EXPECT_EQ(ModeAmplitudesComplex(x, -1, z, 0, A, &E), 1);
  EXPECT_EQ(ModeAmplitudesComplex(x, 2, z, 0, A, &E), 16);
  EXPECT_EQ(ModeAmplitudesComplex(x, 2, z, -5, A, &E), 16);
  EXPECT_EQ(A[0], C(9, 9));
  EXPECT_EQ(E, 9.0);
}

// ---- per-mode parameters -----------------------------------------------------------

struct Reported {
  std::vector<double> amp, phase, damp, freq;
  int32_t count = -1;
};

Reported Params(const std::vector<C>& A, const std::vector<C>& z, double fs, int32_t flag) {
  Reported r;
  const size_t k = z.size();
  const double sentinel = 12345.0;
  r.amp.assign(k, sentinel);
  r.phase.assign(k, sentinel);
  r.damp.assign(k, sentinel);
  r.freq.assign(k, sentinel);
  EXPECT_EQ(ModeParameters(A.data(), int32_t(A.size()), z.data(), int32_t(k), fs, flag,
                           r.amp.data(), r.phase.data(), r.damp.data(), r.freq.data(), &r.count),
            0);
  return r;
}

TEST(ModeParameters, ComplexModeReportsEveryPoleInOrder) {
  const double fs = 1000.0;
  const std::vector<C> z = {std::polar(0.9, 0.5), C(0, 0), std::polar(1.0, -2.0), C(-1.0, 0),
                            C(2.0, 0)};
  const std::vector<C> A = {std::polar(2.0, 1.0), C(-3, 0), C(0, 0), std::polar(0.5, -3.0),
                            C(0, 1)};
  const Reported r = Params(A, z, fs, 0);
  ASSERT_EQ(r.count, 5);
  const double scale = fs / (2 * kPi);
  const double want_freq[] = {0.5 * scale, 0.0, -2.0 * scale, kPi * scale, 0.0};
  const double want_damp[] = {std::log(0.9), -std::numeric_limits<double>::infinity(), 0.0, 0.0,
                              std::log(2.0)};
  const double want_amp[] = {2.0, 3.0, 0.0, 0.5, 1.0};
  const double want_phase[] = {1.0, kPi, 0.0, -3.0, kPi / 2};
  for (int i = 0; i < 5; ++i) {
    EXPECT_NEAR(r.freq[i], want_freq[i], 1e-9) << i;
    if (std::isinf(want_damp[i])) {
      EXPECT_EQ(r.damp[i], want_damp[i]);  // a pole at 0 is not guarded
    } else {
      EXPECT_NEAR(r.damp[i], want_damp[i], 1e-14) << i;
    }
    EXPECT_NEAR(r.amp[i], want_amp[i], 1e-14) << i;
    EXPECT_NEAR(r.phase[i], want_phase[i], 1e-14) << i;
  }
}

TEST(ModeParameters, RealSignalModeKeepsOneMemberPerPairAndDropsTheNegativeAxis) {
  const double fs = 2 * kPi;  // frequency equals the pole angle
  const std::vector<C> z = {std::polar(0.8, -1.0), C(-0.5, 0), std::polar(0.8, 1.0),
                            C(0.7, 0), C(0, 0), std::polar(1.0, 3.0)};
  const std::vector<C> A = {C(1, -1), C(9, 9), C(1, 1), C(-4, 0), C(0, 2), C(0, -0.5)};
  const Reported r = Params(A, z, fs, 1);
  // kept in pole order: angle 1, angle 0 (0.7), angle 0 (the pole at 0), angle 3
  ASSERT_EQ(r.count, 4);
  const double want_freq[] = {1.0, 0.0, 0.0, 3.0};
  const double want_amp[] = {std::sqrt(2.0), 4.0, 2.0, 0.5};  // one member, not doubled
  const double want_phase[] = {kPi / 4, kPi, kPi / 2, -kPi / 2};
  const double want_damp[] = {std::log(0.8), std::log(0.7),
                              -std::numeric_limits<double>::infinity(), 0.0};
  for (int j = 0; j < 4; ++j) {
    EXPECT_NEAR(r.freq[j], want_freq[j], 1e-14) << j;
    EXPECT_NEAR(r.amp[j], want_amp[j], 1e-14) << j;
    EXPECT_NEAR(r.phase[j], want_phase[j], 1e-14) << j;
    if (std::isinf(want_damp[j])) {
      EXPECT_EQ(r.damp[j], want_damp[j]);
    } else {
      EXPECT_NEAR(r.damp[j], want_damp[j], 1e-14) << j;
    }
  }
  for (size_t j = 4; j < z.size(); ++j) EXPECT_EQ(r.freq[j], 12345.0);  // untouched
}

TEST(ModeParameters, ConjugatePairGivesOneModeOnlyWithTheRealFlag) {
  const std::vector<C> z = {std::polar(1.0, 0.25), std::polar(1.0, -0.25)};
  const std::vector<C> A = {std::polar(0.5, 0.1), std::polar(0.5, -0.1)};
  for (int32_t flag : {0, 1, -7}) {
    const Reported r = Params(A, z, 100.0, flag);
    EXPECT_EQ(r.count, flag == 0 ? 2 : 1);
    EXPECT_NEAR(r.freq[0], 0.25 * 100.0 / (2 * kPi), 1e-12);
    EXPECT_NEAR(r.damp[0], 0.0, 1e-15);  // on the unit circle
    if (flag == 0) {
      EXPECT_NEAR(r.freq[1], -r.freq[0], 1e-15);
    }
  }
}

}  // namespace
