// Matrix pencil: exact recovery of noise-free damped exponentials (real and
// complex, tall and wide data matrices), the silent order drop when M exceeds
// the number of singular values, the unguarded row scaling, argument checks,
// and clean failure under exhausted memory.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <limits>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/work.h"
#include "support/damped_modes.h"

namespace {

using damped_modes::Mode;

struct Result {
  StatusCode status = -1;
  int32_t count = -1;
  double mse = -1.0;
  std::vector<double> amp, phase, damp, freq;
  explicit Result(int M) : amp(M, -7.0), phase(M, -7.0), damp(M, -7.0), freq(M, -7.0) {}
};

Result RunComplex(const std::vector<std::complex<double>>& x, int L, int M, double fs) {
  Result r(M);
  r.status = MatrixPencilComplex(x.data(), static_cast<int32_t>(x.size()), L, M, fs, r.amp.data(),
                                 r.phase.data(), r.damp.data(), r.freq.data(), &r.mse, &r.count);
  return r;
}
Result RunReal(const std::vector<double>& x, int L, int M, double fs, int32_t realFlag) {
  Result r(M);
  r.status = MatrixPencilReal(x.data(), static_cast<int32_t>(x.size()), L, M, fs, realFlag,
                              r.amp.data(), r.phase.data(), r.damp.data(), r.freq.data(), &r.mse,
                              &r.count);
  return r;
}

// Every expected mode is found with all four parameters to tol.
void ExpectModes(const Result& r, const std::vector<Mode>& expected, double tol) {
  ASSERT_EQ(r.status, 0);
  ASSERT_EQ(r.count, static_cast<int32_t>(expected.size()));
  for (const Mode& m : expected) {
    const int i = damped_modes::Nearest(m, r.freq.data(), r.damp.data(), r.count);
    ASSERT_GE(i, 0);
    SCOPED_TRACE(testing::Message() << "mode at " << m.freq << " Hz");
    EXPECT_NEAR(r.freq[i], m.freq, tol * 1000.0);  // Hz scale: fs / 2pi times the pole error
    EXPECT_NEAR(r.damp[i], m.damp, tol);
    EXPECT_NEAR(r.amp[i], m.amp, tol);
    EXPECT_NEAR(damped_modes::PhaseDiff(r.phase[i], m.phase), 0.0, tol);
  }
  EXPECT_LT(r.mse, 1e-20);
}

const double kFs = 1000.0;
const std::vector<Mode> kComplexModes = {{1.0, 0.5, -0.01, 50.0},
                                         {0.6, -2.2, -0.04, -130.0},
                                         {0.3, 1.3, 0.0, 275.0}};

// L below, at and above n/2: the last takes the transposed decomposition (q < L).
TEST(MatrixPencil, ComplexModesRecoveredForTallAndWideMatrices) {
  const int n = 45;
  const auto x = damped_modes::ComplexSignal(kComplexModes, n, kFs);
  for (int L : {3, 12, 22, 26, 30}) {  // floor(90/3) = 30; q = 15 at L = 30
    SCOPED_TRACE(testing::Message() << "L=" << L);
    ExpectModes(RunComplex(x, L, 3, kFs), kComplexModes, 1e-8);
  }
}

// Damped cosines: two poles each. The real-signal flag reports the member with
// non-negative frequency (amplitude half the cosine's); flag 0 reports both.
TEST(MatrixPencil, RealModesRecovered) {
  const std::vector<Mode> cosines = {{2.0, 0.7, -0.02, 80.0}, {1.0, -1.0, -0.005, 310.0}};
  const int n = 40;
  const auto x = damped_modes::RealSignal(cosines, n, kFs);
  std::vector<Mode> half, both;
  for (const Mode& m : cosines) {
    half.push_back({m.amp / 2, m.phase, m.damp, m.freq});
    both.push_back({m.amp / 2, m.phase, m.damp, m.freq});
    both.push_back({m.amp / 2, -m.phase, m.damp, -m.freq});
  }
  for (int L : {8, 16, 26}) {  // 26 > n/2: transposed path
    SCOPED_TRACE(testing::Message() << "L=" << L);
    ExpectModes(RunReal(x, L, 4, kFs, 1), half, 1e-8);
    ExpectModes(RunReal(x, L, 4, kFs, 0), both, 1e-8);
  }
}

// The complex twin on real data agrees with the real twin.
TEST(MatrixPencil, ComplexTwinAgreesOnRealData) {
  const auto noise = damped_modes::Noise(36, 1.0, 17);
  const std::vector<std::complex<double>> xc(noise.begin(), noise.end());
  const Result re = RunReal(noise, 10, 5, kFs, 0);
  const Result cx = RunComplex(xc, 10, 5, kFs);
  ASSERT_EQ(re.status, 0);
  ASSERT_EQ(cx.status, 0);
  ASSERT_EQ(cx.count, 5);
  EXPECT_NEAR(re.mse, cx.mse, 1e-12);
  for (int i = 0; i < 5; ++i) {
    const Mode m{0, 0, cx.damp[i], cx.freq[i]};
    const int j = damped_modes::Nearest(m, re.freq.data(), re.damp.data(), re.count);
    EXPECT_NEAR(re.freq[j], cx.freq[i], 1e-8);
    EXPECT_NEAR(re.damp[j], cx.damp[i], 1e-10);
    EXPECT_NEAR(re.amp[j], cx.amp[i], 1e-9);
  }
}

// M above r = min(n - L, L) drops to r modes without complaint.
TEST(MatrixPencil, OrderAboveSingularValueCountDropsToIt) {
  const int n = 30, L = 20;  // r = 10
  auto x = damped_modes::ComplexSignal(kComplexModes, n, kFs);
  const auto nr = damped_modes::Noise(n, 0.2, 1), ni = damped_modes::Noise(n, 0.2, 2);
  for (int t = 0; t < n; ++t) x[t] += std::complex<double>(nr[t], ni[t]);
  for (int M : {10, 12, 20}) {
    const Result r = RunComplex(x, L, M, kFs);
    EXPECT_EQ(r.status, 0) << M;
    EXPECT_EQ(r.count, 10) << M;
    if (M > 10) {
      EXPECT_EQ(r.amp[10], -7.0) << M;  // nothing written past r
    }
  }
  // The r x r pencil comes out with row stride r, as for M = r.
  std::vector<std::complex<double>> K12(144), K10(100);
  ASSERT_EQ(PencilMatrixComplex(x.data(), n, L, 12, K12.data()), 0);
  ASSERT_EQ(PencilMatrixComplex(x.data(), n, L, 10, K10.data()), 0);
  for (int i = 0; i < 100; ++i) EXPECT_EQ(K12[i], K10[i]) << i;

  const std::vector<double> xr(nr.begin(), nr.end());
  const Result rr = RunReal(xr, L, 15, kFs, 0);
  EXPECT_EQ(rr.status, 0);
  EXPECT_EQ(rr.count, 10);
}

// Truncation to M < r keeps the leading M x M block of the full pencil.
TEST(MatrixPencil, TruncationKeepsLeadingBlock) {
  const auto x = damped_modes::Noise(40, 1.0, 23);
  std::vector<double> Kfull(12 * 12), K3(9);
  ASSERT_EQ(PencilMatrixReal(x.data(), 40, 12, 12, Kfull.data()), 0);
  ASSERT_EQ(PencilMatrixReal(x.data(), 40, 12, 3, K3.data()), 0);
  // Only the leading triplets enter the block: equal up to rounding.
  for (int i = 0; i < 3; ++i) {
    for (int j = 0; j < 3; ++j) EXPECT_NEAR(K3[i * 3 + j], Kfull[i * 12 + j], 1e-12);
  }
}

TEST(ScaleRowsByInverse, RowsDividedWithoutThreshold) {
  const double s[3] = {2.0, 0.5, 0.0};
  std::vector<double> A = {1, 2, 3, 4, 5, 6};
  EXPECT_EQ(ScaleRowsByInverseReal(A.data(), 3, 2, s), 0);
  EXPECT_EQ(A[0], 0.5);
  EXPECT_EQ(A[1], 1.0);
  EXPECT_EQ(A[2], 6.0);
  EXPECT_EQ(A[3], 8.0);
  EXPECT_TRUE(std::isinf(A[4]) && std::isinf(A[5]));

  std::vector<std::complex<double>> C = {{1, -2}, {3, 4}, {-1, 0.5}, {0, 1}, {1, 1}, {2, 0}};
  EXPECT_EQ(ScaleRowsByInverseComplex(C.data(), 3, 2, s), 0);
  EXPECT_EQ(C[0], std::complex<double>(0.5, -1.0));
  EXPECT_EQ(C[1], std::complex<double>(1.5, 2.0));
  EXPECT_EQ(C[2], std::complex<double>(-2.0, 1.0));
  EXPECT_EQ(C[3], std::complex<double>(0.0, 2.0));
  for (int i = 4; i < 6; ++i) {
    EXPECT_FALSE(std::isfinite(C[i].real()) && std::isfinite(C[i].imag())) << i;
  }
}

struct CheckCase {
  int32_t n, L, M;
  double fs;
  StatusCode expected;
};

TEST(MatrixPencil, ArgumentChecksInOrder) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const CheckCase cases[] = {
      {0, 2, 1, 1.0, 1},    {-1, -1, 0, -1.0, 1},  {30, -1, 1, 1.0, 11}, {30, 21, 1, 1.0, 11},
      {30, 21, 0, -1, 11},  {30, 5, 0, 1.0, 12},   {30, 0, 0, 1.0, 12},  {30, 5, 6, 1.0, 13},
      {30, 0, 1, 1.0, 13},  {30, 5, 6, -1.0, 13},  {30, 5, 2, 0.0, 18},  {30, 5, 2, -3.0, 18},
      {30, 20, 2, nan, 0},  {30, 5, 2, 1e-300, 0},
  };
  const auto x = damped_modes::Noise(40, 1.0, 31);
  const std::vector<std::complex<double>> xc(x.begin(), x.end());
  std::vector<double> out(64);
  double mse = 0;
  int32_t count = 0;
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << "n=" << c.n << " L=" << c.L << " M=" << c.M
                                    << " fs=" << c.fs);
    EXPECT_EQ(MatrixPencilReal(x.data(), c.n, c.L, c.M, c.fs, 1, out.data(), out.data() + 16,
                               out.data() + 32, out.data() + 48, &mse, &count),
              c.expected);
    EXPECT_EQ(MatrixPencilComplex(xc.data(), c.n, c.L, c.M, c.fs, out.data(), out.data() + 16,
                                  out.data() + 32, out.data() + 48, &mse, &count),
              c.expected);
  }
}

}  // namespace
