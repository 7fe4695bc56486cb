// Eigenvalue routines: right eigenvectors checked by the residual A V - V diag(w)
// computed here in plain loops, orthonormality of symmetric / Hermitian vectors,
// ordering, argument checks and failed allocations.

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <functional>
#include <limits>
#include <random>
#include <vector>

#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

using C = std::complex<double>;
constexpr double kEps = std::numeric_limits<double>::epsilon();

std::vector<C> ToComplex(const std::vector<double>& x) { return {x.begin(), x.end()}; }

// ||A V - V diag(w)||_F / (||A||_F n eps), A and V row-major n-by-n.
double ScaledResidual(const std::vector<C>& A, const std::vector<C>& V, const std::vector<C>& w,
                      int n) {
  double res = 0, norm = 0;
  for (int i = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      C s = 0;
      for (int k = 0; k < n; ++k) s += A[i * n + k] * V[k * n + j];
      res += std::norm(s - V[i * n + j] * w[j]);
      norm += std::norm(A[i * n + j]);
    }
  }
  return std::sqrt(res) / (std::sqrt(norm) * n * kEps);
}

// max |V^H V - I| / (n eps).
double ScaledOrthogonality(const std::vector<C>& V, int n) {
  double worst = 0;
  for (int a = 0; a < n; ++a) {
    for (int b = 0; b < n; ++b) {
      C s = 0;
      for (int k = 0; k < n; ++k) s += std::conj(V[k * n + a]) * V[k * n + b];
      worst = std::max(worst, std::abs(s - C(a == b ? 1.0 : 0.0)));
    }
  }
  return worst / (n * kEps);
}

double ColumnNorm(const std::vector<C>& V, int n, int j) {
  double s = 0;
  for (int i = 0; i < n; ++i) s += std::norm(V[i * n + j]);
  return std::sqrt(s);
}

std::vector<double> RandomReal(std::mt19937_64& rng, int n, bool symmetric) {
  std::normal_distribution<double> g;
  std::vector<double> a(static_cast<size_t>(n) * n);
  for (double& v : a) v = g(rng);
  if (symmetric)
    for (int i = 0; i < n; ++i)
      for (int j = 0; j < i; ++j) a[i * n + j] = a[j * n + i];
  return a;
}

std::vector<C> RandomComplex(std::mt19937_64& rng, int n, bool hermitian) {
  std::normal_distribution<double> g;
  std::vector<C> a(static_cast<size_t>(n) * n);
  for (C& v : a) v = C(g(rng), g(rng));
  if (hermitian) {
    for (int i = 0; i < n; ++i) {
      a[i * n + i] = a[i * n + i].real();
      for (int j = 0; j < i; ++j) a[i * n + j] = std::conj(a[j * n + i]);
    }
  }
  return a;
}

// ---- general real ----------------------------------------------------------------------

TEST(EigGeneralReal, RotationGivesIThenMinusIWithRightVectors) {
  const std::vector<double> A = {0, 1, -1, 0};
  std::vector<C> w(2), V(4);
  ASSERT_EQ(EigGeneralReal(A.data(), 2, 1, w.data(), V.data()), 0);
  EXPECT_NEAR(std::abs(w[0] - C(0, 1)), 0, 1e-15);
  EXPECT_NEAR(std::abs(w[1] - C(0, -1)), 0, 1e-15);
  for (int i = 0; i < 2; ++i) EXPECT_EQ(V[i * 2 + 1], std::conj(V[i * 2]));
  EXPECT_LT(ScaledResidual(ToComplex(A), V, w, 2), 10);
}

TEST(EigGeneralReal, NonSymmetricGivesRightNotLeftVectors) {
  const std::vector<double> A = {1, 2, 0, 3};
  std::vector<C> w(2), V(4);
  ASSERT_EQ(EigGeneralReal(A.data(), 2, 1, w.data(), V.data()), 0);
  const int j = std::abs(w[0] - 3.0) < std::abs(w[1] - 3.0) ? 0 : 1;
  EXPECT_NEAR(w[j].real(), 3.0, 1e-14);
  EXPECT_NEAR(std::abs(V[0 * 2 + j] - V[1 * 2 + j]), 0, 1e-14);  // proportional to (1, 1)
  EXPECT_NEAR(ColumnNorm(V, 2, j), 1.0, 1e-14);
  EXPECT_LT(ScaledResidual(ToComplex(A), V, w, 2), 10);
}

TEST(EigGeneralReal, RandomMatricesSatisfyAVEqualsVLambda) {
  std::mt19937_64 rng(1);
  for (int n = 1; n <= 24; n += (n < 8 ? 1 : 5)) {
    const std::vector<double> A = RandomReal(rng, n, false);
    std::vector<C> w(n), V(static_cast<size_t>(n) * n), w_only(n);
    ASSERT_EQ(EigGeneralReal(A.data(), n, 1, w.data(), V.data()), 0);
    EXPECT_LT(ScaledResidual(ToComplex(A), V, w, n), 30) << n;
    for (int j = 0; j < n; ++j) EXPECT_NEAR(ColumnNorm(V, n, j), 1.0, 1e-13);
    // Conjugate pairs come together, positive imaginary part first.
    for (int j = 0; j < n; ++j) {
      if (w[j].imag() > 0) {
        ASSERT_LT(j + 1, n);
        EXPECT_EQ(w[j + 1], std::conj(w[j]));
        ++j;
      } else {
        EXPECT_EQ(w[j].imag(), 0.0);
      }
    }
    // Without vectors: the same eigenvalues, within rounding.
    ASSERT_EQ(EigGeneralReal(A.data(), n, 0, w_only.data(), nullptr), 0);
    for (int j = 0; j < n; ++j) EXPECT_LT(std::abs(w_only[j] - w[j]), 1e-10 * (1 + std::abs(w[j])));
    // The complex twin on the same real data finds the same multiset.
    std::vector<C> Ac = ToComplex(A), wc(n);
    ASSERT_EQ(EigGeneralComplex(Ac.data(), n, 0, wc.data(), nullptr), 0);
    for (const C& z : w) {
      double d = 1e300;
      for (const C& y : wc) d = std::min(d, std::abs(y - z));
      EXPECT_LT(d, 1e-9 * (1 + std::abs(z)));
    }
  }
}

// ---- general complex ---------------------------------------------------------------------

TEST(EigGeneralComplex, RandomMatricesAndVectorsOverA) {
  std::mt19937_64 rng(2);
  for (int n = 1; n <= 24; n += (n < 8 ? 1 : 5)) {
    const std::vector<C> A = RandomComplex(rng, n, false);
    std::vector<C> a = A, w(n), V(static_cast<size_t>(n) * n);
    ASSERT_EQ(EigGeneralComplex(a.data(), n, 1, w.data(), V.data()), 0);
    EXPECT_EQ(a, A);  // untouched with a vectors argument
    EXPECT_LT(ScaledResidual(A, V, w, n), 30) << n;
    for (int j = 0; j < n; ++j) {
      EXPECT_NEAR(ColumnNorm(V, n, j), 1.0, 1e-13);
      // The component of largest modulus is real.
      int big = 0;
      for (int i = 1; i < n; ++i)
        if (std::abs(V[i * n + j]) > std::abs(V[big * n + j])) big = i;
      EXPECT_NEAR(V[big * n + j].imag(), 0.0, 1e-14);
    }
    std::vector<C> w2(n);
    ASSERT_EQ(EigGeneralComplex(a.data(), n, 1, w2.data(), nullptr), 0);
    EXPECT_EQ(w2, w);
    EXPECT_EQ(a, V);  // the vectors landed in A's storage
  }
}

// ---- symmetric / Hermitian -------------------------------------------------------------

TEST(EigSymReal, AscendingValuesOrthonormalVectorsAndNullOverwritesA) {
  std::mt19937_64 rng(3);
  for (int n = 1; n <= 30; n += (n < 8 ? 1 : 7)) {
    const std::vector<double> A = RandomReal(rng, n, true);
    std::vector<double> a = A, w(n), V(static_cast<size_t>(n) * n);
    ASSERT_EQ(EigSymReal(a.data(), n, 1, w.data(), V.data()), 0);
    EXPECT_EQ(a, A);
    EXPECT_TRUE(std::is_sorted(w.begin(), w.end()));
    EXPECT_LT(ScaledResidual(ToComplex(A), ToComplex(V), ToComplex(w), n), 30) << n;
    EXPECT_LT(ScaledOrthogonality(ToComplex(V), n), 30);
    std::vector<double> w_only(n);
    ASSERT_EQ(EigSymReal(a.data(), n, 0, w_only.data(), nullptr), 0);
    EXPECT_EQ(a, A);  // no vectors: A stays
    for (int j = 0; j < n; ++j) EXPECT_NEAR(w_only[j], w[j], 1e-12 * (1 + std::abs(w[j])));
    ASSERT_EQ(EigSymReal(a.data(), n, 1, w.data(), nullptr), 0);
    EXPECT_EQ(a, V);
  }
  // Known spectrum: diag(3, -1, 2) ascending.
  std::vector<double> d = {3, 0, 0, 0, -1, 0, 0, 0, 2}, w(3);
  ASSERT_EQ(EigSymReal(d.data(), 3, 0, w.data(), nullptr), 0);
  EXPECT_EQ(w, (std::vector<double>{-1, 2, 3}));
}

TEST(EigHermitianComplex, AscendingValuesAndRightVectors) {
  std::mt19937_64 rng(4);
  for (int n = 1; n <= 30; n += (n < 8 ? 1 : 7)) {
    const std::vector<C> A = RandomComplex(rng, n, true);
    std::vector<double> w(n);
    std::vector<C> V(static_cast<size_t>(n) * n);
    ASSERT_EQ(EigHermitianComplex(A.data(), n, 1, w.data(), V.data()), 0);
    EXPECT_TRUE(std::is_sorted(w.begin(), w.end()));
    EXPECT_LT(ScaledResidual(A, V, ToComplex(w), n), 30) << n;
    EXPECT_LT(ScaledOrthogonality(V, n), 30);
  }
  // [2 i; -i 2]: eigenvalues 1 and 3; for 3 the vector is proportional to (1, -i).
  const std::vector<C> A = {2, C(0, 1), C(0, -1), 2};
  std::vector<double> w(2);
  std::vector<C> V(4);
  ASSERT_EQ(EigHermitianComplex(A.data(), 2, 1, w.data(), V.data()), 0);
  EXPECT_NEAR(w[0], 1.0, 1e-15);
  EXPECT_NEAR(w[1], 3.0, 1e-15);
  EXPECT_NEAR(std::abs(V[1 * 2 + 1] / V[0 * 2 + 1] - C(0, -1)), 0, 1e-14);
}

TEST(EigComplex, DispatchOnTheHermitianFlag) {
  std::mt19937_64 rng(5);
  const int n = 6;
  const std::vector<C> H = RandomComplex(rng, n, true);
  std::vector<double> wh(n);
  std::vector<C> Vh(n * n);
  ASSERT_EQ(EigHermitianComplex(H.data(), n, 1, wh.data(), Vh.data()), 0);

  std::vector<C> a = H, w(n), V(n * n);
  ASSERT_EQ(EigComplex(a.data(), n, 1, 1, w.data(), V.data()), 0);
  for (int j = 0; j < n; ++j) EXPECT_EQ(w[j], C(wh[j], 0.0));
  EXPECT_EQ(V, Vh);
  ASSERT_EQ(EigComplex(a.data(), n, 1, 1, w.data(), nullptr), 0);
  EXPECT_EQ(a, Vh);  // null vectors: A's storage, as on the general branch

  const std::vector<C> G = RandomComplex(rng, n, false);
  std::vector<C> g1 = G, g2 = G, w1(n), w2(n), V1(n * n), V2(n * n);
  ASSERT_EQ(EigGeneralComplex(g1.data(), n, 1, w1.data(), V1.data()), 0);
  ASSERT_EQ(EigComplex(g2.data(), n, 0, 1, w2.data(), V2.data()), 0);
  EXPECT_EQ(w1, w2);
  EXPECT_EQ(V1, V2);

  for (int flag : {-1, 2})
    EXPECT_EQ(EigComplex(g2.data(), n, flag, 0, w2.data(), nullptr), status::kBadOption);
}

// ---- argument checks ------------------------------------------------------------------

TEST(EigArguments, SizeOptionAndNonFiniteChecks) {
  double rd[4] = {1, 2, 2, 1};
  C cd[4] = {1, 2, 2, 1};
  C cw[2], cv[4];
  double rw[2], rv[4];
  const std::vector<std::pair<const char*, std::function<StatusCode(int32_t, int32_t)>>> calls = {
      {"general real", [&](int32_t n, int32_t v) { return EigGeneralReal(rd, n, v, cw, cv); }},
      {"general complex",
       [&](int32_t n, int32_t v) { return EigGeneralComplex(cd, n, v, cw, cv); }},
      {"symmetric", [&](int32_t n, int32_t v) { return EigSymReal(rd, n, v, rw, rv); }},
      {"hermitian", [&](int32_t n, int32_t v) { return EigHermitianComplex(cd, n, v, rw, cv); }},
      {"front general", [&](int32_t n, int32_t v) { return EigComplex(cd, n, 0, v, cw, cv); }},
      {"front hermitian", [&](int32_t n, int32_t v) { return EigComplex(cd, n, 1, v, cw, cv); }},
  };
  for (const auto& [name, call] : calls) {
    EXPECT_EQ(call(0, 0), status::kBadSize) << name;
    EXPECT_EQ(call(-2, 2), status::kBadSize) << name;
    NumAllocFailAt(0, false);
    EXPECT_EQ(call(2, 2), status::kBadOption) << name;
    EXPECT_EQ(NumAllocAttempts(), 0) << name << ": refused before any allocation";
    EXPECT_EQ(call(2, 1), 0) << name;
    rd[3] = std::numeric_limits<double>::quiet_NaN();
    cd[3] = C(1, std::numeric_limits<double>::infinity());
    EXPECT_EQ(call(2, 0), status::kNonFinite) << name;
    rd[3] = 1;
    cd[3] = 1;
  }
}

// ---- allocation failures ----------------------------------------------------------------

// Fails the k-th allocation for k = 1, 2, ... until the call succeeds; every
// failure must be -20001 with nothing written and nothing leaked.
template <typename Snapshot>
void FailEachAllocation(const char* name, const std::function<StatusCode()>& call,
                        const Snapshot& snapshot) {
  const auto before = snapshot();
  for (int64_t k = 1;; ++k) {
    const int64_t outstanding = NumAllocOutstanding();
    NumAllocFailAt(k, false);
    const StatusCode st = call();
    NumAllocFailAt(0, false);
    EXPECT_EQ(NumAllocOutstanding(), outstanding) << name << " k=" << k;
    if (st == 0) break;
    ASSERT_EQ(st, status::kNoMemory) << name << " k=" << k;
    EXPECT_TRUE(snapshot() == before) << name << " k=" << k << ": outputs written";
    ASSERT_LT(k, 20);
  }
}

TEST(EigAllocation, EachFailureIsReportedCleanly) {
  std::mt19937_64 rng(6);
  const int n = 5;
  std::vector<double> rs = RandomReal(rng, n, true), rg = RandomReal(rng, n, false);
  std::vector<C> ch = RandomComplex(rng, n, true), cg = RandomComplex(rng, n, false);
  std::vector<C> cw(n, C(7, 7)), cv(n * n, C(7, 7));
  std::vector<double> rw(n, 7), rv(n * n, 7);
  for (int32_t want = 0; want <= 1; ++want) {
    FailEachAllocation(
        "general real", [&] { return EigGeneralReal(rg.data(), n, want, cw.data(), cv.data()); },
        [&] { return std::make_pair(cw, cv); });
    FailEachAllocation(
        "general complex",
        [&] { return EigGeneralComplex(cg.data(), n, want, cw.data(), nullptr); },
        [&] { return std::make_pair(cw, cg); });
    FailEachAllocation(
        "symmetric", [&] { return EigSymReal(rs.data(), n, want, rw.data(), nullptr); },
        [&] { return std::make_pair(rw, rs); });
    FailEachAllocation(
        "hermitian", [&] { return EigHermitianComplex(ch.data(), n, want, rw.data(), cv.data()); },
        [&] { return std::make_pair(rw, cv); });
    FailEachAllocation(
        "front hermitian", [&] { return EigComplex(ch.data(), n, 1, want, cw.data(), cv.data()); },
        [&] { return std::make_pair(cw, cv); });
  }
}

}  // namespace
