// PolyRootsComplex against the eigenvalues of the companion matrix (LAPACK
// zgeev, called here directly), closed forms, ordering and failure paths.

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <limits>
#include <random>
#include <vector>

#include "numeric/lapack_api.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

using C = std::complex<double>;
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

// Eigenvalues of the companion matrix of c[0] + ... + c[m] z^m (column-major).
std::vector<C> CompanionRoots(const std::vector<C>& c) {
  const int m = static_cast<int>(c.size()) - 1;
  std::vector<C> a(static_cast<size_t>(m) * m, C(0, 0));
  for (int j = 0; j < m; ++j) a[static_cast<size_t>(j) * m] = -c[m - 1 - j] / c[m];
  for (int i = 1; i < m; ++i) a[static_cast<size_t>(i - 1) * m + i] = C(1, 0);
  std::vector<C> w(m), work(4 * m);
  std::vector<double> rwork(2 * m);
  const int lwork = 4 * m;
  int info = 0;
  C dummy;
  const int one = 1;
  LAPACK_zgeev("N", "N", &m, a.data(), &m, w.data(), &dummy, &one, &dummy, &one, work.data(),
               &lwork, rwork.data(), &info);
  EXPECT_EQ(info, 0);
  return w;
}

// Every expected root has its own computed root within tol (relative to
// max(1, |root|)); nearest-first greedy matching of the two multisets.
void ExpectSameMultiset(std::vector<C> got, const std::vector<C>& want, double tol) {
  ASSERT_EQ(got.size(), want.size());
  for (const C& w : want) {
    size_t best = 0;
    double dist = std::numeric_limits<double>::infinity();
    for (size_t i = 0; i < got.size(); ++i) {
      const double d = std::abs(got[i] - w);
      if (d < dist) {
        dist = d;
        best = i;
      }
    }
    EXPECT_LT(dist, tol * std::max(1.0, std::abs(w))) << "root " << w;
    got.erase(got.begin() + static_cast<ptrdiff_t>(best));
  }
}

StatusCode Roots(const std::vector<C>& c, std::vector<C>* roots, int32_t max_iterations = 1000) {
  roots->assign(c.size() > 1 ? c.size() - 1 : 1, C(-99, -99));
  return PolyRootsComplex(c.data(), static_cast<int32_t>(c.size()), max_iterations, roots->data());
}

TEST(PolyRoots, RandomPolynomialsMatchCompanionEigenvalues) {
  std::mt19937_64 rng(20240611);
  std::normal_distribution<double> g;
  for (int degree = 1; degree <= 40; ++degree) {
    for (int trial = 0; trial < 5; ++trial) {
      std::vector<C> c(degree + 1);
      for (C& v : c) v = C(g(rng), g(rng));
      std::vector<C> roots;
      ASSERT_EQ(Roots(c, &roots), 0) << "degree " << degree;
      ExpectSameMultiset(roots, CompanionRoots(c), 1e-7);
      // Residuals of the roots in the original polynomial, relative to the
      // size of its terms.
      for (const C& z : roots) {
        C p = 0;
        double scale = 0;
        for (int k = degree; k >= 0; --k) {
          p = p * z + c[k];
          scale = scale * std::abs(z) + std::abs(c[k]);
        }
        EXPECT_LT(std::abs(p), 1e-10 * scale) << "degree " << degree << " root " << z;
      }
    }
  }
}

TEST(PolyRoots, RealAutoregressivePolynomials) {
  // Known poles inside the unit circle, as the estimators produce them:
  // conjugate pairs near the circle.
  std::mt19937_64 rng(5);
  std::uniform_real_distribution<double> radius(0.5, 0.999), angle(0.05, 3.0);
  for (int pairs = 2; pairs <= 12; ++pairs) {
    std::vector<C> poles;
    for (int i = 0; i < pairs; ++i) {
      const C z = std::polar(radius(rng), angle(rng));
      poles.push_back(z);
      poles.push_back(std::conj(z));
    }
    std::vector<C> c = {C(1, 0)};  // prod (z - pole), lowest order first
    for (const C& z : poles) {
      std::vector<C> next(c.size() + 1, C(0, 0));
      for (size_t k = 0; k < c.size(); ++k) {
        next[k + 1] += c[k];
        next[k] -= z * c[k];
      }
      c = next;
    }
    std::vector<C> roots;
    ASSERT_EQ(Roots(c, &roots), 0);
    ExpectSameMultiset(roots, poles, 1e-6);
  }
}

TEST(PolyRoots, ClosedFormsInTheirOrder) {
  struct Case {
    std::vector<C> c;
    StatusCode status;
    std::vector<C> roots;  // exact, in order
  };
  const std::vector<Case> cases = {
      {{0, 0, 1}, 0, {0, 0}},
      {{1, 0, 0}, status::kBadPolynomial, {}},
      {{-2, 1}, 0, {2}},
      {{2, -3, 1}, 0, {2, 1}},
      {{0, 0, 0, -2, 1, 0}, 0, {0, 0, 0, 2}},
      {{0, 6, -5, 1}, 0, {0, 3, 2}},      // zero root, then the quadratic
      {{C(0, 2), C(0, -2)}, 0, {1}},      // scaled division by an imaginary divisor
      {{5}, status::kBadPolynomial, {}},  // a constant
      {{0}, status::kBadPolynomial, {}},
      {{0, 0}, status::kBadPolynomial, {}},
      {{0, 3}, 0, {0}},
      {{4, 0, 1}, 0, {C(0, -2), C(0, 2)}},  // q = 0 + 4i
  };
  for (const Case& tc : cases) {
    std::vector<C> roots;
    ASSERT_EQ(Roots(tc.c, &roots), tc.status) << tc.c.size();
    for (size_t i = 0; i < tc.roots.size(); ++i) {
      EXPECT_NEAR(roots[i].real(), tc.roots[i].real(), 1e-15) << i;
      EXPECT_NEAR(roots[i].imag(), tc.roots[i].imag(), 1e-15) << i;
    }
    for (size_t i = tc.roots.size(); i < roots.size(); ++i) EXPECT_EQ(roots[i], C(-99, -99));
  }
  EXPECT_EQ(PolyRootsComplex(nullptr, 0, 1000, nullptr), status::kBadSize);
}

TEST(PolyRoots, NaNCoefficientRejectedBeforeAnyRoot) {
  for (size_t at = 0; at < 5; ++at) {
    for (int part = 0; part < 2; ++part) {
      std::vector<C> c = {0, 0, 1, 2, 3};  // two zero roots would come first
      c[at] = part == 0 ? C(kNaN, 0) : C(0, kNaN);
      std::vector<C> roots;
      EXPECT_EQ(Roots(c, &roots), status::kBadPolynomial);
      for (const C& r : roots) EXPECT_EQ(r, C(-99, -99));
    }
  }
}

TEST(PolyRoots, AliasedOutputGivesTheSameRoots) {
  std::mt19937_64 rng(11);
  std::normal_distribution<double> g;
  for (int degree : {1, 2, 3, 7, 20}) {
    std::vector<C> c(degree + 1);
    for (C& v : c) v = C(g(rng), g(rng));
    c[0] = 0;  // a zero root as well
    std::vector<C> separate;
    ASSERT_EQ(Roots(c, &separate), 0);
    std::vector<C> inout = c;
    ASSERT_EQ(PolyRootsComplex(inout.data(), degree + 1, 1000, inout.data()), 0);
    for (int i = 0; i < degree; ++i) EXPECT_EQ(inout[i], separate[i]) << degree << " " << i;
    EXPECT_EQ(inout[degree], c[degree]);  // past the roots: untouched
  }
}

TEST(PolyRoots, MultipleRoots) {
  struct Case {
    std::vector<C> c;
    std::vector<C> roots;
    double tol;
  };
  const std::vector<Case> cases = {
      // (z - 1)^3 (z + 2)
      {{-2, 5, -3, -1, 1}, {1, 1, 1, -2}, 1e-4},
      // (z - 1)^2 (z - 2)^2
      {{4, -12, 13, -6, 1}, {1, 1, 2, 2}, 1e-6},
      // (z - i)^4 = z^4 - 4i z^3 - 6 z^2 + 4i z + 1
      {{1, C(0, 4), -6, C(0, -4), 1}, {C(0, 1), C(0, 1), C(0, 1), C(0, 1)}, 1e-3},
      // (z + 0.5)^5
      {{0.03125, 0.3125, 1.25, 2.5, 2.5, 1}, {-0.5, -0.5, -0.5, -0.5, -0.5}, 1e-2},
  };
  for (const Case& tc : cases) {
    std::vector<C> roots;
    ASSERT_EQ(Roots(tc.c, &roots), 0);
    ExpectSameMultiset(roots, tc.roots, tc.tol);
  }
}

TEST(PolyRoots, IterationLimitAndOverflow) {
  std::mt19937_64 rng(2);
  std::normal_distribution<double> g;
  std::vector<C> c(31);
  for (C& v : c) v = C(g(rng), g(rng));
  std::vector<C> roots;
  EXPECT_EQ(Roots(c, &roots, 1), status::kNoConvergence);
  EXPECT_EQ(NumAllocOutstanding(), 0);
  // Coefficients at the top of the range: 3 c[3] of the derivative overflows.
  const std::vector<C> big = {1e308, 1e308, 1e308, 1e308};
  EXPECT_EQ(Roots(big, &roots), status::kRootNaN);
  EXPECT_EQ(roots[0], C(-99, -99));
  // An infinite coefficient passes the screening and ends the same way.
  const std::vector<C> inf = {1, 1, C(std::numeric_limits<double>::infinity(), 0), 1};
  EXPECT_EQ(Roots(inf, &roots), status::kRootNaN);
  EXPECT_EQ(NumAllocOutstanding(), 0);
}

TEST(PolyRoots, AllocationFailures) {
  const std::vector<C> c = {1, 2, 3, 4, 5};
  for (bool alias : {false, true}) {
    for (int64_t k = 1;; ++k) {
      std::vector<C> buf = c;
      std::vector<C> roots(4, C(-99, -99));
      const int64_t before = NumAllocOutstanding();
      NumAllocFailAt(k, false);
      const StatusCode st =
          PolyRootsComplex(buf.data(), 5, 1000, alias ? buf.data() : roots.data());
      NumAllocFailAt(0, false);
      EXPECT_EQ(NumAllocOutstanding(), before);
      if (st == 0) {
        EXPECT_EQ(k, alias ? 3 : 2);
        break;
      }
      ASSERT_EQ(st, status::kNoMemory) << k;
      if (alias) {
        EXPECT_EQ(buf, c);
      } else {
        for (const C& r : roots) EXPECT_EQ(r, C(-99, -99));
      }
    }
  }
}

}  // namespace
