// SVD checked by LAPACK-style scaled residuals: reconstruction U diag(S) V^H of A,
// orthonormal columns of U and V, non-negative non-increasing S.

#include <gtest/gtest.h>

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <string>
#include <vector>

#include "numeric/lapack_boundary.h"
#include "numeric/numeric.h"
#include "support/alloc_faults.h"
#include "support/dense_oracles.h"

using qdm_test::Cx;

namespace {

template <typename T>
StatusCode SvdNamed(const T* A, int32_t m, int32_t n, T* U, double* S, T* V, int32_t full) {
  if constexpr (qdm_test::kIsCx<T>) {
    return SvdComplex(A, m, n, U, S, V, full);
  } else {
    return SvdReal(A, m, n, U, S, V, full);
  }
}

struct Shape {
  int32_t m, n, rank;  // rank < min(m, n) builds a rank-deficient A
};

template <typename T>
std::vector<T> TestMatrix(const Shape& s, uint32_t seed) {
  const int32_t k = std::min(s.m, s.n);
  if (s.rank >= k) return qdm_test::RandomMatrix<T>(s.m, s.n, seed);
  const auto f = qdm_test::RandomMatrix<T>(s.m, s.rank, seed);
  const auto g = qdm_test::RandomMatrix<T>(s.rank, s.n, seed + 1);
  return qdm_test::NaiveProduct(f.data(), g.data(), s.m, s.rank, s.n);
}

template <typename T>
struct SvdBuffers {
  int32_t p, q, k;
  std::vector<T> U, V;
  std::vector<double> S;
  SvdBuffers(int32_t m, int32_t n, int32_t full)
      : p(full ? m : std::min(m, n)),
        q(full ? n : std::min(m, n)),
        k(std::min(m, n)),
        U(static_cast<size_t>(m) * p, T(-7.0)),
        V(static_cast<size_t>(n) * q, T(-7.0)),
        S(static_cast<size_t>(k), -7.0) {}
};

template <typename T>
class SvdTyped : public ::testing::Test {};
using Scalars = ::testing::Types<double, Cx>;
TYPED_TEST_SUITE(SvdTyped, Scalars);

TYPED_TEST(SvdTyped, FactorsReconstructAAndAreOrthonormal) {
  using T = TypeParam;
  const Shape shapes[] = {{1, 1, 1},   {3, 2, 2},   {2, 3, 2},   {1, 6, 1},  {6, 1, 1},
                          {5, 5, 5},   {7, 3, 3},   {3, 7, 3},   {22, 42, 22}, {40, 22, 22},
                          {22, 40, 22}, {60, 20, 20}, {6, 5, 2},  {5, 8, 1}};
  for (int32_t full : {0, 1}) {
    for (const Shape& s : shapes) {
      SCOPED_TRACE(::testing::Message() << s.m << "x" << s.n << " rank " << s.rank
                                        << " full " << full);
      const auto a = TestMatrix<T>(s, 21);
      const auto a_before = a;
      SvdBuffers<T> out(s.m, s.n, full);
      ASSERT_EQ(SvdNamed(a.data(), s.m, s.n, out.U.data(), out.S.data(), out.V.data(), full), 0);
      EXPECT_EQ(a, a_before);

      for (int32_t i = 0; i < out.k; ++i) {
        EXPECT_GE(out.S[i], 0.0);
        if (i > 0) {
          EXPECT_LE(out.S[i], out.S[i - 1]);
        }
      }
      // U(:, 0:k) diag(S) V(:, 0:k)^H
      std::vector<T> us(static_cast<size_t>(s.m) * out.k);
      for (int32_t i = 0; i < s.m; ++i) {
        for (int32_t j = 0; j < out.k; ++j) us[i * out.k + j] = out.U[i * out.p + j] * out.S[j];
      }
      std::vector<T> vk(static_cast<size_t>(s.n) * out.k);
      for (int32_t i = 0; i < s.n; ++i) {
        for (int32_t j = 0; j < out.k; ++j) vk[i * out.k + j] = out.V[i * out.q + j];
      }
      const auto vh = qdm_test::NaiveAdjoint(vk.data(), s.n, out.k);
      const auto rec = qdm_test::NaiveProduct(us.data(), vh.data(), s.m, out.k, s.n);
      const double scale = qdm_test::FrobNorm(a.data(), int64_t{s.m} * s.n) *
                           std::max(s.m, s.n) * qdm_test::kEps;
      EXPECT_LT(qdm_test::FrobDiff(rec.data(), a.data(), int64_t{s.m} * s.n) / scale, 30.0);
      EXPECT_LT(qdm_test::OrthonormalityError(out.U.data(), s.m, out.p) / (s.m * qdm_test::kEps),
                30.0);
      EXPECT_LT(qdm_test::OrthonormalityError(out.V.data(), s.n, out.q) / (s.n * qdm_test::kEps),
                30.0);
      // Rank deficiency shows in the trailing singular values.
      if (s.rank < out.k) {
        EXPECT_LT(out.S[s.rank], 1e-12 * out.S[0]);
      }
    }
  }
}

TYPED_TEST(SvdTyped, OneByOneNegative) {
  using T = TypeParam;
  const T a = T(-3.0);
  T u{}, v{};
  double s = 0.0;
  ASSERT_EQ(SvdNamed(&a, 1, 1, &u, &s, &v, 0), 0);
  EXPECT_DOUBLE_EQ(s, 3.0);
  EXPECT_NEAR(std::abs(u * s * qdm_test::Conj(v) - a), 0.0, 1e-15);
}

TEST(SvdComplexOnly, VIsConjugatedNotMerelyTransposed) {
  // A = [i] has U V^H = i: the phase must be split so that the product holds.
  const Cx a[2] = {Cx(0.0, 1.0), Cx(2.0, -1.0)};  // 1-by-2
  Cx u[1], v[2];
  double s[1];
  ASSERT_EQ(SvdComplex(a, 1, 2, u, s, v, 0), 0);
  for (int j = 0; j < 2; ++j) EXPECT_NEAR(std::abs(u[0] * s[0] * std::conj(v[j]) - a[j]), 0.0, 1e-14);
}

TYPED_TEST(SvdTyped, BadInputLeavesOutputsUntouched) {
  using T = TypeParam;
  struct Case {
    int32_t m, n;
    double bad;  // written into one entry (real part, then imaginary part) when not 0
    StatusCode want;
  } cases[] = {{0, 3, 0.0, -20003},        {3, 0, 0.0, -20003},      {-1, 2, 0.0, -20003},
               {3, 2, DBL_MAX, -20068},    {3, 2, -DBL_MAX, -20068}, {3, 2, NAN, -20068},
               {3, 2, -INFINITY, -20068},  {2, 3, -1.7976931348623e308, -20068}};
  for (const Case& c : cases) {
    for (int part = 0; part < (qdm_test::kIsCx<T> ? 2 : 1); ++part) {
      SCOPED_TRACE(::testing::Message() << c.m << "x" << c.n << " " << c.bad << " part " << part);
      auto a = qdm_test::RandomMatrix<T>(3, 3, 4);
      if (c.bad != 0.0) {
        if constexpr (qdm_test::kIsCx<T>) {
          a[4] = part == 0 ? T(c.bad, 0.0) : T(0.0, c.bad);
        } else {
          a[4] = c.bad;
        }
      }
      SvdBuffers<T> out(3, 3, 1);
      EXPECT_EQ(SvdNamed(a.data(), c.m, c.n, out.U.data(), out.S.data(), out.V.data(), 1), c.want);
      for (const T& v : out.U) EXPECT_EQ(v, T(-7.0));
      for (const T& v : out.V) EXPECT_EQ(v, T(-7.0));
      for (double v : out.S) EXPECT_EQ(v, -7.0);
    }
  }
}

TYPED_TEST(SvdTyped, FailedAllocationLeavesOutputsUntouched) {
  using T = TypeParam;
  for (int32_t full : {0, 1}) {
    const Shape s{5, 3, 3};
    const auto a = TestMatrix<T>(s, 8);
    SvdBuffers<T> out(s.m, s.n, full);
    const int64_t allocations = qdm_test::FailEachAllocation(
        [&] { return SvdNamed(a.data(), s.m, s.n, out.U.data(), out.S.data(), out.V.data(), full); },
        [&] {
          for (const T& v : out.U) EXPECT_EQ(v, T(-7.0));
          for (const T& v : out.V) EXPECT_EQ(v, T(-7.0));
          for (double v : out.S) EXPECT_EQ(v, -7.0);
        });
    EXPECT_GE(allocations, 4);
  }
}

}  // namespace

// A driver failure injected at the boundary reaches each caller as the status
// its driver's INFO maps to, with nothing written.
TEST(LapackBoundary, InjectedInfoMapsPerDriver) {
  const auto a = qdm_test::RandomMatrix<double>(6, 4, 5);
  const auto b = qdm_test::RandomMatrix<double>(6, 1, 6);
  struct Case {
    const char* name;
    int32_t info;
    StatusCode want;
  } cases[] = {{"svd", 3, -20062},       {"svd", -2, -20062},  {"eig", 1, -20062},
               {"eig", -4, -20999},      {"gelsd", 2, -20062}, {"gelsd", -3, 20001},
               {"qr solve", -1, -20999}, {"sym eig", 5, -20062}};
  for (const Case& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.name << " INFO " << c.info);
    std::vector<double> u(24, 7.0), s(4, 7.0), v(16, 7.0), x(4, 7.0);
    std::vector<Cx> w(4, Cx(7.0)), vec(16, Cx(7.0));
    const std::string name = c.name;
    LapackFailAt(1, c.info, false);
    StatusCode st = 0;
    if (name == "svd") st = SvdReal(a.data(), 6, 4, u.data(), s.data(), v.data(), 0);
    if (name == "eig") st = EigGeneralReal(a.data(), 4, 1, w.data(), vec.data());
    if (name == "gelsd") st = LeastSquaresReal(a.data(), 3, 4, b.data(), 1, x.data(), -1.0);
    if (name == "qr solve") st = LeastSquaresComplex(std::vector<Cx>(a.begin(), a.end()).data(), 6, 2,
                                                     std::vector<Cx>(b.begin(), b.end()).data(), 1,
                                                     w.data(), -1.0);
    if (name == "sym eig") st = EigSymReal(std::vector<double>(16, 1.0).data(), 4, 0, s.data(), nullptr);
    EXPECT_EQ(LapackCalls(), 1);
    LapackFailAt(0, 0, false);
    EXPECT_EQ(st, c.want);
    // gelsd's negative INFO is not an error: the rank LAPACK left (none) decides.
    if (c.want < 0) {
      for (double e : u) EXPECT_EQ(e, 7.0);
      for (double e : x) EXPECT_EQ(e, 7.0);
      for (const Cx& e : vec) EXPECT_EQ(e, Cx(7.0));
    }
  }
}
