// Principal-component AR, matrix pencil and MDL order through the exports only:
// output counts and types, the values recovered from records of known modes,
// and the chosen order.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <vector>

#include "support/damped_modes.h"
#include "support/qdm_host.h"

namespace {

using damped_modes::Mode;
using qdmtest::HostArray;
using qdmtest::Qdm;

const double kFs = 1000.0;

// ---- principal-component AR ----------------------------------------------------------------
// Noise-free unit-modulus exponentials: k of the p roots sit on the signal poles.
TEST(PcarExports, SignalRootsOfNoiseFreeRecords) {
  const int n = 50, p = 9;
  const std::vector<Mode> cmodes = {{1.0, 0.4, 0.0, 60.0}, {0.7, -2.0, 0.0, -185.0}};
  const auto xc = damped_modes::ComplexSignal(cmodes, n, kFs);
  auto x = HostArray::Complex(xc);
  auto a = HostArray::Empty(QDM_TYPE_COMPLEX), roots = HostArray::Empty(QDM_TYPE_COMPLEX);
  ASSERT_EQ(Qdm().QdmCxPCARH(x, p, 2, a, roots), 0);
  ASSERT_EQ(a.Count(), p + 1);
  ASSERT_EQ(roots.Count(), p);
  const auto ac = a.Complexes();
  const auto rc = roots.Complexes();
  EXPECT_EQ(ac[0], std::complex<double>(1.0, 0.0));
  for (const Mode& m : cmodes) {
    EXPECT_LT(damped_modes::DistanceToNearest(damped_modes::Pole(m, kFs), rc.data(), p), 1e-8);
  }

  const std::vector<Mode> rmodes = {{1.0, 0.2, 0.0, 75.0}, {0.5, -0.9, 0.0, 260.0}};
  const auto xrv = damped_modes::RealSignal(rmodes, n, kFs);
  auto xr = HostArray::Real(xrv);
  auto ar = HostArray::Empty(QDM_TYPE_DOUBLE), rr = HostArray::Empty(QDM_TYPE_COMPLEX);
  ASSERT_EQ(Qdm().QdmRePCARH(xr, p, 4, ar, rr), 0);
  ASSERT_EQ(ar.Count(), p + 1);
  ASSERT_EQ(rr.Count(), p);
  const auto coeffs = ar.Reals();
  const auto rootsR = rr.Complexes();
  EXPECT_EQ(coeffs[0], 1.0);
  for (const Mode& m : rmodes) {
    const auto z = damped_modes::Pole(m, kFs);
    EXPECT_LT(damped_modes::DistanceToNearest(z, rootsR.data(), p), 1e-8);
    EXPECT_LT(damped_modes::DistanceToNearest(std::conj(z), rootsR.data(), p), 1e-8);
  }
  // Every root is a zero of z^p + a1 z^(p-1) + ... + ap.
  for (const auto& z : rootsR) {
    std::complex<double> v = 0.0;
    for (double c : coeffs) v = v * z + c;
    EXPECT_LT(std::abs(v), 1e-9) << z;
  }
}

// The real and complex exports agree on real data.
TEST(PcarExports, TwinsAgreeOnRealData) {
  const int n = 40, p = 6, k = 3;
  const auto xv = damped_modes::Noise(n, 1.0, 5);
  const std::vector<std::complex<double>> xcv(xv.begin(), xv.end());
  auto xr = HostArray::Real(xv);
  auto xc = HostArray::Complex(xcv);
  auto ar = HostArray::Empty(QDM_TYPE_DOUBLE), rr = HostArray::Empty(QDM_TYPE_COMPLEX);
  auto ac = HostArray::Empty(QDM_TYPE_COMPLEX), rc = HostArray::Empty(QDM_TYPE_COMPLEX);
  ASSERT_EQ(Qdm().QdmRePCARH(xr, p, k, ar, rr), 0);
  ASSERT_EQ(Qdm().QdmCxPCARH(xc, p, k, ac, rc), 0);
  const auto a1 = ar.Reals();
  const auto a2 = ac.Complexes();
  ASSERT_EQ(a2.size(), a1.size());
  for (size_t j = 0; j < a1.size(); ++j) {
    EXPECT_NEAR(a2[j].real(), a1[j], 1e-10);
    EXPECT_NEAR(a2[j].imag(), 0.0, 1e-10);
  }
}

// ---- matrix pencil -------------------------------------------------------------------------
struct PencilOut {
  int32_t status;
  double mse;
  HostArray amp = HostArray::Empty(QDM_TYPE_DOUBLE), phase = HostArray::Empty(QDM_TYPE_DOUBLE),
            damp = HostArray::Empty(QDM_TYPE_DOUBLE), freq = HostArray::Empty(QDM_TYPE_DOUBLE);
};

PencilOut PencilComplex(const std::vector<std::complex<double>>& xv, int L, int M) {
  auto x = HostArray::Complex(xv);
  PencilOut o{};
  o.mse = -1.0;
  o.status = Qdm().QdmCxMatrixPencilH(x, L, M, kFs, o.amp, o.phase, o.damp, o.freq, &o.mse);
  return o;
}
PencilOut PencilReal(const std::vector<double>& xv, int L, int M, uint8_t flag) {
  auto x = HostArray::Real(xv);
  PencilOut o{};
  o.mse = -1.0;
  o.status = Qdm().QdmReMatrixPencilH(x, L, M, kFs, &flag, o.amp, o.phase, o.damp, o.freq,
                                      &o.mse);
  return o;
}

void ExpectModes(const PencilOut& o, const std::vector<Mode>& expected) {
  ASSERT_EQ(o.status, 0);
  const int32_t count = o.amp.Count();
  ASSERT_EQ(count, static_cast<int32_t>(expected.size()));
  EXPECT_EQ(o.phase.Count(), count);
  EXPECT_EQ(o.damp.Count(), count);
  EXPECT_EQ(o.freq.Count(), count);
  const auto amp = o.amp.Reals(), phase = o.phase.Reals(), damp = o.damp.Reals(),
             freq = o.freq.Reals();
  for (const Mode& m : expected) {
    const int i = damped_modes::Nearest(m, freq.data(), damp.data(), count);
    ASSERT_GE(i, 0);
    EXPECT_NEAR(freq[i], m.freq, 1e-5) << m.freq;
    EXPECT_NEAR(damp[i], m.damp, 1e-8) << m.freq;
    EXPECT_NEAR(amp[i], m.amp, 1e-8) << m.freq;
    EXPECT_NEAR(damped_modes::PhaseDiff(phase[i], m.phase), 0.0, 1e-8) << m.freq;
  }
  EXPECT_LT(o.mse, 1e-20);
}

TEST(MatrixPencilExports, ComplexModesRecovered) {
  const std::vector<Mode> modes = {{1.0, 0.5, -0.01, 50.0},
                                   {0.6, -2.2, -0.04, -130.0},
                                   {0.3, 1.3, 0.0, 275.0}};
  const auto x = damped_modes::ComplexSignal(modes, 45, kFs);
  for (int L : {12, 28}) {  // 28 > n/2: transposed decomposition
    SCOPED_TRACE(testing::Message() << "L=" << L);
    ExpectModes(PencilComplex(x, L, 3), modes);
  }
}

TEST(MatrixPencilExports, RealModesRecoveredWithAndWithoutRealFlag) {
  const std::vector<Mode> cosines = {{2.0, 0.7, -0.02, 80.0}, {1.0, -1.0, -0.005, 310.0}};
  const auto x = damped_modes::RealSignal(cosines, 40, kFs);
  std::vector<Mode> half, both;
  for (const Mode& m : cosines) {
    half.push_back({m.amp / 2, m.phase, m.damp, m.freq});
    both.push_back({m.amp / 2, m.phase, m.damp, m.freq});
    both.push_back({m.amp / 2, -m.phase, m.damp, -m.freq});
  }
  for (int L : {10, 25}) {
    SCOPED_TRACE(testing::Message() << "L=" << L);
    ExpectModes(PencilReal(x, L, 4, 1), half);
    ExpectModes(PencilReal(x, L, 4, 0), both);
  }
}

// M above r = min(n - L, L) reports r modes.
TEST(MatrixPencilExports, OrderAboveSingularValueCountDropsToIt) {
  const auto noise = damped_modes::Noise(30, 1.0, 3);
  const std::vector<std::complex<double>> xc(noise.begin(), noise.end());
  const PencilOut c = PencilComplex(xc, 20, 14);
  EXPECT_EQ(c.status, 0);
  EXPECT_EQ(c.amp.Count(), 10);
  EXPECT_EQ(c.freq.Count(), 10);
  const PencilOut r = PencilReal(noise, 20, 14, 0);
  EXPECT_EQ(r.status, 0);
  EXPECT_EQ(r.amp.Count(), 10);
}

// ---- MDL -------------------------------------------------------------------------------------
int32_t MdlComplex(const std::vector<std::complex<double>>& xv, int L, int minOrder,
                   int32_t* order) {
  auto x = HostArray::Complex(xv);
  return Qdm().QdmCxMinDescriptLenH(x, L, minOrder, order);
}
int32_t MdlReal(const std::vector<double>& xv, int L, int minOrder, int32_t* order) {
  auto x = HostArray::Real(xv);
  return Qdm().QdmReMinDescriptLenH(x, L, minOrder, order);
}

TEST(MdlExports, ChoosesTheModeCount) {
  const int n = 64;
  const std::vector<Mode> three = {{1.0, 0.5, -0.01, 50.0},
                                   {0.6, -2.2, -0.03, -130.0},
                                   {0.4, 1.3, 0.0, 275.0}};
  const std::vector<Mode> cosines = {{1.0, 0.3, -0.01, 70.0}, {0.7, 1.9, -0.02, 240.0}};
  auto xc = damped_modes::ComplexSignal(three, n, kFs);
  auto xr = damped_modes::RealSignal(cosines, n, kFs);
  int32_t order = -1;
  ASSERT_EQ(MdlComplex(xc, 20, 1, &order), 0);
  EXPECT_EQ(order, 3);
  ASSERT_EQ(MdlReal(xr, 20, 1, &order), 0);
  EXPECT_EQ(order, 4);

  // With noise: the penalty keeps the order at the true count.
  const auto nr = damped_modes::Noise(n, 1e-3, 51), ni = damped_modes::Noise(n, 1e-3, 52);
  for (int t = 0; t < n; ++t) {
    xc[t] += std::complex<double>(nr[t], ni[t]);
    xr[t] += nr[t];
  }
  ASSERT_EQ(MdlComplex(xc, 16, 1, &order), 0);
  EXPECT_EQ(order, 3);
  ASSERT_EQ(MdlReal(xr, 16, 2, &order), 0);
  EXPECT_EQ(order, 4);
}

// minOrder above r = n - L' leaves the result as the caller set it.
TEST(MdlExports, NoCandidateLeavesResultUntouched) {
  const auto xv = damped_modes::Noise(30, 1.0, 7);
  const std::vector<std::complex<double>> xcv(xv.begin(), xv.end());
  int32_t order = 55;
  EXPECT_EQ(MdlReal(xv, 20, 12, &order), 0);
  EXPECT_EQ(order, 55);
  EXPECT_EQ(MdlComplex(xcv, 20, 12, &order), 0);
  EXPECT_EQ(order, 55);
}

// n = 7, L = 3 = floor(n/2) runs with L' = 2, so order 3 is never tried.
TEST(MdlExports, HalfLengthPencilParameterLowered) {
  std::vector<double> xv(7);
  for (int t = 0; t < 7; ++t) {
    xv[t] = std::pow(0.9, t) + 0.5 * std::pow(0.6, t) + 0.8 * std::pow(-0.7, t);
  }
  const std::vector<std::complex<double>> xcv(xv.begin(), xv.end());
  int32_t order = -1;
  ASSERT_EQ(MdlReal(xv, 4, 1, &order), 0);
  EXPECT_EQ(order, 3);
  ASSERT_EQ(MdlComplex(xcv, 4, 2, &order), 0);
  EXPECT_EQ(order, 3);
  ASSERT_EQ(MdlReal(xv, 3, 1, &order), 0);
  EXPECT_LE(order, 2);
  ASSERT_EQ(MdlComplex(xcv, 3, 1, &order), 0);
  EXPECT_LE(order, 2);
}

}  // namespace
