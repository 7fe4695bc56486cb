// Principal-component AR: argument checks, the truncation threshold against
// matrices of known singular values, the full-rank solution against an
// independent least-squares solve, exact signal roots for noise-free records,
// real-data symmetry, and clean failure under exhausted memory.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/numeric.h"
#include "numeric/work.h"
#include "support/damped_modes.h"

namespace {

using damped_modes::Mode;
using CL = std::complex<long double>;

// ---- argument checks -------------------------------------------------------------------
struct CheckCase {
  int32_t n, p, k;
  StatusCode expected;
};

TEST(PcarEstimate, ArgumentChecksInOrder) {
  const CheckCase cases[] = {
      {0, 2, 1, 1},      {-3, -1, 0, 1},  // n first
      {30, -1, 1, 11},   {30, 21, 1, 11}, {30, 21, 0, 11},  // floor(60/3) = 20
      {30, 20, 0, 12},   {30, 5, -2, 12},
      {30, 5, 6, 13},    {30, 0, 1, 13},  {30, 0, 4, 13},  {30, 0, 0, 12},
  };
  std::vector<double> x(40, 1.0);
  std::vector<std::complex<double>> xc(40, 1.0);
  std::vector<double> a(64);
  std::vector<std::complex<double>> ac(64), roots(64);
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << "n=" << c.n << " p=" << c.p << " k=" << c.k);
    EXPECT_EQ(PcarEstimateReal(x.data(), c.n, c.p, c.k, a.data(), roots.data()), c.expected);
    EXPECT_EQ(PcarEstimateComplex(xc.data(), c.n, c.p, c.k, ac.data(), roots.data()),
              c.expected);
  }
}

// ---- threshold ---------------------------------------------------------------------------
double Cj(double v) { return v; }
Complex Cj(Complex v) { return std::conj(v); }

// A = H1 [diag(s); 0] H2 with Householder reflections H = I - 2 v v^H / v^H v,
// so A has exactly the singular values s.
template <typename T>
std::vector<T> Reflector(int m, uint32_t seed) {
  const auto re = damped_modes::Noise(m, 1.0, seed);
  const auto im = damped_modes::Noise(m, 1.0, seed + 101);
  std::vector<T> v(static_cast<size_t>(m));
  for (int i = 0; i < m; ++i) {
    if constexpr (std::is_same_v<T, double>) {
      v[i] = re[i];
    } else {
      v[i] = T(re[i], im[i]);
    }
  }
  double vv = 0;
  for (const T& e : v) vv += std::norm(e);
  std::vector<T> H(static_cast<size_t>(m * m));
  for (int i = 0; i < m; ++i) {
    for (int j = 0; j < m; ++j) {
      H[i * m + j] = (i == j ? T(1.0) : T(0.0)) - 2.0 * v[i] * Cj(v[j]) / vv;
    }
  }
  return H;
}

template <typename T>
std::vector<T> WithSingularValues(int rows, int cols, const std::vector<double>& s,
                                  bool rotate) {
  std::vector<T> D(static_cast<size_t>(rows * cols));
  for (size_t i = 0; i < s.size(); ++i) D[i * cols + i] = T(s[i]);
  if (!rotate) return D;
  const auto H1 = Reflector<T>(rows, 7), H2 = Reflector<T>(cols, 11);
  std::vector<T> A(D.size());
  for (int i = 0; i < rows; ++i) {
    for (int j = 0; j < cols; ++j) {
      T acc(0.0);
      for (int a = 0; a < rows; ++a) {
        for (int b = 0; b < cols; ++b) acc += H1[i * rows + a] * D[a * cols + b] * H2[b * cols + j];
      }
      A[i * cols + j] = acc;
    }
  }
  return A;
}

StatusCode Threshold(const double* A, int32_t r, int32_t c, int32_t k, double* tau) {
  return PcarThresholdReal(A, r, c, k, tau);
}
StatusCode Threshold(const Complex* A, int32_t r, int32_t c, int32_t k, double* tau) {
  return PcarThresholdComplex(A, r, c, k, tau);
}

template <typename T>
class PcarThresholdTest : public testing::Test {};
using Scalars = testing::Types<double, Complex>;
TYPED_TEST_SUITE(PcarThresholdTest, Scalars);

// k < min(rows, cols): midpoint of s_k and s_(k+1); k = min: half of s_k. Both
// Gram branches (tall and wide A) are covered.
TYPED_TEST(PcarThresholdTest, MidpointOfKeptAndDroppedSingularValues) {
  struct Shape {
    int rows, cols;
    std::vector<double> s;
  };
  const Shape shapes[] = {{8, 4, {5.0, 3.0, 2.0, 0.5}},
                          {3, 5, {7.0, 1.0, 0.25}},
                          {4, 4, {9.0, 4.0, 3.5, 1e-3}}};
  for (const auto& sh : shapes) {
    const auto A = WithSingularValues<TypeParam>(sh.rows, sh.cols, sh.s, true);
    const int mn = static_cast<int>(sh.s.size());
    for (int k = 1; k <= mn; ++k) {
      SCOPED_TRACE(testing::Message() << sh.rows << "x" << sh.cols << " k=" << k);
      const double expected =
          k == mn ? 0.5 * sh.s[k - 1] : 0.5 * (sh.s[k - 1] + sh.s[static_cast<size_t>(k)]);
      double tau = -1.0;
      ASSERT_EQ(Threshold(A.data(), sh.rows, sh.cols, k, &tau), 0);
      EXPECT_NEAR(tau, expected, 1e-12 * sh.s[0]);
    }
  }
}

// Tied k-th and (k+1)-th singular values: tau equals both, and the strict test of
// the pseudo-inverse drops the tied pair with everything weaker. A diagonal A
// keeps the arithmetic exact.
TEST(PcarThreshold, TiedSingularValuesAreDroppedTogether) {
  const std::vector<double> s = {4.0, 2.0, 2.0, 1.0};
  auto A = WithSingularValues<double>(6, 4, s, false);
  double tau = 0.0;
  ASSERT_EQ(PcarThresholdReal(A.data(), 6, 4, 2, &tau), 0);
  EXPECT_EQ(tau, 2.0);
  std::vector<double> P(24);
  ASSERT_EQ(PseudoInverseReal(A.data(), 6, 4, tau, P.data()), 0);
  for (int i = 0; i < 4; ++i) {
    for (int j = 0; j < 6; ++j) EXPECT_EQ(P[i * 6 + j], (i == 0 && j == 0) ? 0.25 : 0.0);
  }
}

// ---- estimator -----------------------------------------------------------------------------
// Forward-backward system built from its definition, solved by normal equations
// in long double (Gauss-Jordan with partial pivoting).
std::vector<CL> FullLeastSquaresAr(const std::vector<CL>& x, int p, bool conjBackward) {
  const int n = static_cast<int>(x.size()), q = n - p;
  std::vector<std::vector<CL>> A;
  std::vector<CL> b;
  for (int i = 0; i < q; ++i) {
    std::vector<CL> row;
    for (int j = 0; j < p; ++j) row.push_back(x[i + p - 1 - j]);
    A.push_back(row);
    b.push_back(x[i + p]);
  }
  for (int i = 0; i < q; ++i) {
    std::vector<CL> row;
    for (int j = 0; j < p; ++j) row.push_back(conjBackward ? std::conj(x[i + 1 + j]) : x[i + 1 + j]);
    A.push_back(row);
    b.push_back(conjBackward ? std::conj(x[i]) : x[i]);
  }
  std::vector<std::vector<CL>> N(p, std::vector<CL>(p + 1));
  for (int r = 0; r < p; ++r) {
    for (int c = 0; c < p; ++c) {
      for (size_t i = 0; i < A.size(); ++i) N[r][c] += std::conj(A[i][r]) * A[i][c];
    }
    for (size_t i = 0; i < A.size(); ++i) N[r][p] += std::conj(A[i][r]) * b[i];
  }
  for (int c = 0; c < p; ++c) {
    int piv = c;
    for (int r = c + 1; r < p; ++r) {
      if (std::abs(N[r][c]) > std::abs(N[piv][c])) piv = r;
    }
    std::swap(N[c], N[piv]);
    for (int r = 0; r < p; ++r) {
      if (r == c) continue;
      const CL f = N[r][c] / N[c][c];
      for (int k = c; k <= p; ++k) N[r][k] -= f * N[c][k];
    }
  }
  std::vector<CL> a(p + 1);
  a[0] = 1;
  for (int j = 0; j < p; ++j) a[j + 1] = -N[j][p] / N[j][j];
  return a;
}

// With k = p every singular value exceeds tau = s_p / 2, so the estimate is the
// ordinary forward-backward least-squares solution.
TEST(PcarEstimate, AllComponentsKeptGivesLeastSquaresSolution) {
  const int n = 48, p = 5;
  const std::vector<Mode> modes = {{1.0, 0.3, -0.01, 90.0}, {0.6, -1.2, -0.03, 210.0}};
  auto xc = damped_modes::ComplexSignal(modes, n, 1000.0);
  const auto nr = damped_modes::Noise(n, 0.05, 3), ni = damped_modes::Noise(n, 0.05, 4);
  std::vector<double> xr(n);
  std::vector<CL> lc(n), lr(n);
  for (int t = 0; t < n; ++t) {
    xc[t] += std::complex<double>(nr[t], ni[t]);
    xr[t] = xc[t].real();
    lc[t] = CL(xc[t].real(), xc[t].imag());
    lr[t] = CL(xr[t], 0.0L);
  }
  std::vector<std::complex<double>> ac(p + 1), roots(p);
  std::vector<double> ar(p + 1);
  ASSERT_EQ(PcarEstimateComplex(xc.data(), n, p, p, ac.data(), roots.data()), 0);
  ASSERT_EQ(PcarEstimateReal(xr.data(), n, p, p, ar.data(), roots.data()), 0);
  const auto refc = FullLeastSquaresAr(lc, p, true);
  const auto refr = FullLeastSquaresAr(lr, p, false);
  for (int j = 0; j <= p; ++j) {
    EXPECT_NEAR(std::abs(CL(ac[j].real(), ac[j].imag()) - refc[j]), 0.0, 1e-10) << j;
    EXPECT_NEAR(ar[j], static_cast<double>(refr[j].real()), 1e-10) << j;
  }
}

// Noise-free unit-modulus exponentials: the forward-backward matrix has rank k
// exactly, and the truncated solution puts k roots on the signal poles.
TEST(PcarEstimate, NoiseFreeSignalRootsAreExact) {
  const double fs = 1000.0;
  const std::vector<Mode> cmodes = {{1.0, 0.4, 0.0, 60.0}, {0.7, -2.0, 0.0, -185.0},
                                    {0.4, 1.1, 0.0, 333.0}};
  const int n = 50, p = 9;
  const auto xc = damped_modes::ComplexSignal(cmodes, n, fs);
  std::vector<std::complex<double>> ac(p + 1), roots(p);
  ASSERT_EQ(PcarEstimateComplex(xc.data(), n, p, 3, ac.data(), roots.data()), 0);
  for (const auto& m : cmodes) {
    EXPECT_LT(damped_modes::DistanceToNearest(damped_modes::Pole(m, fs), roots.data(), p), 1e-8)
        << m.freq;
  }

  // Two real cosines: four poles, k = 4.
  const std::vector<Mode> rmodes = {{1.0, 0.2, 0.0, 75.0}, {0.5, -0.9, 0.0, 260.0}};
  const auto xr = damped_modes::RealSignal(rmodes, n, fs);
  std::vector<double> ar(p + 1);
  ASSERT_EQ(PcarEstimateReal(xr.data(), n, p, 4, ar.data(), roots.data()), 0);
  for (const auto& m : rmodes) {
    const auto z = damped_modes::Pole(m, fs);
    EXPECT_LT(damped_modes::DistanceToNearest(z, roots.data(), p), 1e-8) << m.freq;
    EXPECT_LT(damped_modes::DistanceToNearest(std::conj(z), roots.data(), p), 1e-8) << m.freq;
  }
  // The roots are those of z^p + a1 z^(p-1) + ... + ap.
  for (int i = 0; i < p; ++i) {
    std::complex<double> v = 0.0;
    for (int j = 0; j <= p; ++j) v = v * roots[i] + ar[j];
    EXPECT_LT(std::abs(v), 1e-9) << i;
  }
}

// Real records: a[0] = 1, roots in conjugate pairs, and the complex twin agrees
// (conjugating a real backward block changes nothing).
TEST(PcarEstimate, RealRecordGivesConjugateRootPairs) {
  const int n = 60, p = 8, k = 5;
  const std::vector<Mode> modes = {{1.0, 0.1, -0.005, 40.0}, {0.8, 2.0, -0.02, 170.0}};
  auto x = damped_modes::RealSignal(modes, n, 1000.0);
  const auto noise = damped_modes::Noise(n, 0.1, 9);
  for (int t = 0; t < n; ++t) x[t] += noise[t];
  std::vector<double> a(p + 1);
  std::vector<std::complex<double>> roots(p), ac(p + 1), rootsc(p);
  ASSERT_EQ(PcarEstimateReal(x.data(), n, p, k, a.data(), roots.data()), 0);
  EXPECT_EQ(a[0], 1.0);
  for (int i = 0; i < p; ++i) {
    EXPECT_LT(damped_modes::DistanceToNearest(std::conj(roots[i]), roots.data(), p),
              1e-8 * std::max(1.0, std::abs(roots[i])))
        << roots[i];
  }
  const std::vector<std::complex<double>> xc(x.begin(), x.end());
  ASSERT_EQ(PcarEstimateComplex(xc.data(), n, p, k, ac.data(), rootsc.data()), 0);
  for (int j = 0; j <= p; ++j) {
    EXPECT_NEAR(ac[j].real(), a[j], 1e-10) << j;
    EXPECT_NEAR(ac[j].imag(), 0.0, 1e-10) << j;
  }
}

// The largest order allowed is accepted and reaches the (then square-ish) system.
TEST(PcarEstimate, LargestOrderAccepted) {
  const int n = 9, p = 6;  // 2q = 6 = p: the wide Gram branch
  const auto x = damped_modes::Noise(n, 1.0, 21);
  std::vector<double> a(p + 1);
  std::vector<std::complex<double>> roots(p);
  EXPECT_EQ(PcarEstimateReal(x.data(), n, p, 2, a.data(), roots.data()), 0);
  EXPECT_EQ(a[0], 1.0);
}

}  // namespace
