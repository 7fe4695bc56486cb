// Least squares and pseudo-inverses, checked by properties that share nothing
// with LAPACK: the residual is orthogonal to the columns of A, the solution lies
// in the row space of A (minimum norm), closed forms for one-row systems, and
// the four Moore-Penrose conditions. DGELSD is interposed in this executable to
// see which path a solve took and what RCOND it was handed.

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <vector>

#include "numeric/lapack_api.h"
#include "numeric/numeric.h"
#include "support/alloc_faults.h"
#include "support/dense_oracles.h"

using qdm_test::Cx;

namespace {
int g_gelsd_calls = 0;
double g_gelsd_rcond = -1.0;
}  // namespace

extern "C" void LAPACK_dgelsd(lapack_int const* m, lapack_int const* n, lapack_int const* nrhs,
                              double* A, lapack_int const* lda, double* B, lapack_int const* ldb,
                              double* S, double const* rcond, lapack_int* rank, double* work,
                              lapack_int const* lwork, lapack_int* iwork, lapack_int* info) {
  using Fn = decltype(&LAPACK_dgelsd);
  static Fn next = reinterpret_cast<Fn>(dlsym(RTLD_NEXT, "dgelsd_"));
  ++g_gelsd_calls;
  g_gelsd_rcond = *rcond;
  next(m, n, nrhs, A, lda, B, ldb, S, rcond, rank, work, lwork, iwork, info);
}

namespace {

using qdm_test::kEps;
using qdm_test::NaiveAdjoint;
using qdm_test::NaiveProduct;

// A = F (m-by-r) * G (r-by-n): rank r, rows spanning the rows of G.
template <typename T>
struct LowRank {
  std::vector<T> A, G;
  int32_t r;
};
template <typename T>
LowRank<T> MakeLowRank(int32_t m, int32_t n, int32_t r, uint32_t seed) {
  LowRank<T> lr;
  lr.r = r;
  if (r >= std::min(m, n)) {  // full rank: A's own rows span its row space
    lr.A = qdm_test::RandomMatrix<T>(m, n, seed);
    lr.G = m <= n ? lr.A : std::vector<T>();
    if (m > n) lr.r = 0;  // row space is everything: nothing to check
    else lr.r = m;
    return lr;
  }
  const auto f = qdm_test::RandomMatrix<T>(m, r, seed);
  lr.G = qdm_test::RandomMatrix<T>(r, n, seed + 1);
  lr.A = NaiveProduct(f.data(), lr.G.data(), m, r, n);
  return lr;
}

// Solves the small Hermitian positive definite system M c = y in long double.
template <typename W>
std::vector<W> SolveSmall(std::vector<W> M, std::vector<W> y, int64_t r) {
  for (int64_t p = 0; p < r; ++p) {
    for (int64_t i = p + 1; i < r; ++i) {
      const W f = M[i * r + p] / M[p * r + p];
      for (int64_t j = p; j < r; ++j) M[i * r + j] -= f * M[p * r + j];
      y[i] -= f * y[p];
    }
  }
  for (int64_t i = r - 1; i >= 0; --i) {
    for (int64_t j = i + 1; j < r; ++j) y[i] -= M[i * r + j] * y[j];
    y[i] /= M[i * r + i];
  }
  return y;
}

// Relative distance of each column of X (n-by-nrhs) from the span of the
// conjugated rows of G (r-by-n): zero exactly when X is a minimum-norm solution.
template <typename T>
double RowSpaceDistance(const std::vector<T>& G, int32_t r, int32_t n, const T* X,
                        int32_t nrhs) {
  if (r == 0) return 0.0;
  using W = decltype(qdm_test::Widen(T()));
  std::vector<W> gram(static_cast<size_t>(r) * r);
  for (int32_t i = 0; i < r; ++i) {
    for (int32_t j = 0; j < r; ++j) {
      W s = 0;
      for (int32_t l = 0; l < n; ++l) s += qdm_test::Widen(G[i * n + l]) * qdm_test::Widen(qdm_test::Conj(G[j * n + l]));
      gram[i * r + j] = s;
    }
  }
  double worst = 0.0;
  for (int32_t c = 0; c < nrhs; ++c) {
    std::vector<W> y(static_cast<size_t>(r));
    long double xnorm = 0;
    for (int32_t i = 0; i < r; ++i) {
      W s = 0;
      for (int32_t l = 0; l < n; ++l) s += qdm_test::Widen(G[i * n + l]) * qdm_test::Widen(X[l * nrhs + c]);
      y[i] = s;
    }
    const std::vector<W> coef = SolveSmall(gram, y, r);
    long double dist = 0;
    for (int32_t l = 0; l < n; ++l) {
      W proj = 0;
      for (int32_t i = 0; i < r; ++i) proj += qdm_test::Widen(qdm_test::Conj(G[i * n + l])) * coef[i];
      dist += std::norm(qdm_test::Widen(X[l * nrhs + c]) - proj);
      xnorm += std::norm(qdm_test::Widen(X[l * nrhs + c]));
    }
    worst = std::max(worst, static_cast<double>(std::sqrt(dist / std::max(xnorm, 1e-300L))));
  }
  return worst;
}

// ||A^H (A X - B)|| scaled by ||A|| (||A|| ||X|| + ||B||) max(m, n) eps.
template <typename T>
double NormalEquationError(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs,
                           const T* X) {
  auto r = NaiveProduct(A, X, m, n, nrhs);
  for (size_t i = 0; i < r.size(); ++i) r[i] -= B[i];
  const auto ah = NaiveAdjoint(A, m, n);
  const auto g = NaiveProduct(ah.data(), r.data(), n, m, nrhs);
  const double na = qdm_test::FrobNorm(A, int64_t{m} * n);
  const double nx = qdm_test::FrobNorm(X, int64_t{n} * nrhs);
  const double nb = qdm_test::FrobNorm(B, int64_t{m} * nrhs);
  return qdm_test::FrobNorm(g.data(), int64_t{n} * nrhs) /
         (na * (na * nx + nb) * std::max(m, n) * kEps);
}

struct Problem {
  int32_t m, n, rank, nrhs;
};

const Problem kProblems[] = {
    {1, 1, 1, 1},  {4, 4, 4, 2},  {10, 4, 4, 3}, {3, 2, 1, 1},  {6, 5, 2, 2},
    {1, 5, 1, 1},  {5, 1, 1, 4},  {22, 42, 22, 1}, {8, 12, 3, 2}, {30, 7, 7, 1},
    // tall enough to be factored in several row blocks, full rank and deficient
    {2000, 40, 40, 2}, {1500, 40, 12, 1},
};

using Solver = StatusCode (*)(const double*, int32_t, int32_t, const double*, int32_t, double*,
                              double);

template <typename T, typename Solve>
void CheckSolver(Solve solve) {
  for (const Problem& p : kProblems) {
    SCOPED_TRACE(::testing::Message() << p.m << "x" << p.n << " rank " << p.rank << " nrhs "
                                      << p.nrhs);
    const LowRank<T> lr = MakeLowRank<T>(p.m, p.n, p.rank, 31);
    const auto b = qdm_test::RandomMatrix<T>(p.m, p.nrhs, 32);
    const auto a_in = lr.A, b_in = b;
    std::vector<T> x(static_cast<size_t>(p.n) * p.nrhs, T(-5.0));
    const StatusCode want = p.rank < std::min(p.m, p.n) ? 20001 : 0;
    ASSERT_EQ(solve(lr.A.data(), p.m, p.n, b.data(), p.nrhs, x.data(), -1.0), want);
    EXPECT_EQ(lr.A, a_in);
    EXPECT_EQ(b, b_in);
    EXPECT_LT(NormalEquationError(lr.A.data(), p.m, p.n, b.data(), p.nrhs, x.data()), 100.0);
    EXPECT_LT(RowSpaceDistance(lr.G, lr.r, p.n, x.data(), p.nrhs), 1e-10);
  }
}

TEST(LeastSquares, RealDgelsdSolvesInTheMinimumNormSense) {
  CheckSolver<double>(LeastSquaresReal);
}
TEST(LeastSquares, RealPinvSolvesInTheMinimumNormSense) {
  CheckSolver<double>(LeastSquaresPinvReal);
}
TEST(LeastSquares, ComplexSolvesInTheMinimumNormSense) {
  CheckSolver<Cx>(LeastSquaresComplex);
}

TEST(LeastSquares, RankOneThreeByTwo) {
  // Columns (1,2,2) and 2*(1,2,2): X = pinv(A) b is (1, 2)^T * (u.b) / (5 * 9).
  const double a[6] = {1, 2, 2, 4, 2, 4};
  const double b[3] = {1, 0, 3};
  double x[2] = {0, 0};
  ASSERT_EQ(LeastSquaresReal(a, 3, 2, b, 1, x, -1.0), 20001);
  const double ub = 1 * 1 + 2 * 0 + 2 * 3;
  EXPECT_NEAR(x[0], ub * 1 / 45.0, 1e-15);
  EXPECT_NEAR(x[1], ub * 2 / 45.0, 1e-15);
}

// Either side of each width limit: both paths give the minimum-norm solution of
// a one-row system in closed form (x = a^T b / |a|^2), and for m rows the
// minimum-norm checks; only the narrower one calls DGELSD.
TEST(LeastSquares, WideSystemSwitch) {
  struct Case {
    int32_t m, n;
    bool gelsd;
  } cases[] = {{1, 739, true},    {1, 740, false},   {2, 802, true},  {2, 803, false},
               {10, 1386, true},  {10, 1387, false}, {3, 868, true},  {3, 869, false}};
  for (const Case& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.m << "x" << c.n);
    const auto a = qdm_test::RandomMatrix<double>(c.m, c.n, 41);
    const auto b = qdm_test::RandomMatrix<double>(c.m, 2, 42);
    std::vector<double> x(static_cast<size_t>(c.n) * 2);
    g_gelsd_calls = 0;
    ASSERT_EQ(LeastSquaresReal(a.data(), c.m, c.n, b.data(), 2, x.data(), -1.0), 0);
    EXPECT_EQ(g_gelsd_calls, c.gelsd ? 2 : 0);  // workspace query, then the solve
    EXPECT_LT(NormalEquationError(a.data(), c.m, c.n, b.data(), 2, x.data()), 100.0);
    EXPECT_LT(RowSpaceDistance(a, c.m, c.n, x.data(), 2), 1e-10);
    if (c.m == 1) {
      long double aa = 0;
      for (double v : a) aa += static_cast<long double>(v) * v;
      for (int32_t i = 0; i < c.n; ++i) {
        for (int32_t j = 0; j < 2; ++j) {
          EXPECT_NEAR(x[i * 2 + j], static_cast<double>(a[i] * b[j] / aa), 1e-14);
        }
      }
    }
  }
  // Tall and square systems never switch.
  const auto a = qdm_test::RandomMatrix<double>(2000, 3, 43);
  const auto b = qdm_test::RandomMatrix<double>(2000, 1, 44);
  double x[3];
  g_gelsd_calls = 0;
  ASSERT_EQ(LeastSquaresReal(a.data(), 2000, 3, b.data(), 1, x, -1.0), 0);
  EXPECT_EQ(g_gelsd_calls, 2);
}

TEST(LeastSquares, RcondHandling) {
  // Singular values 1 and 1e-20 (exactly).
  const double a[6] = {1, 0, 0, 1e-20, 0, 0};
  const double b[3] = {1, 1e-20, 1};
  double x[2];
  struct Case {
    double rcond, handed;  // RCOND given to DGELSD = max(m, n) * rcond, eps when rcond < 0 or NaN
  } cases[] = {{0.0, 0.0}, {-1.0, 3 * kEps}, {NAN, 3 * kEps}, {1e-3, 3e-3}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.rcond);
    (void)LeastSquaresReal(a, 3, 2, b, 1, x, c.rcond);
    EXPECT_EQ(g_gelsd_rcond, c.handed);
  }
  // (DGELSD itself reads an RCOND of 0 as machine epsilon, so the rank it
  // reports then is its own choice; only the handed value is ours.)
  EXPECT_EQ(LeastSquaresReal(a, 3, 2, b, 1, x, -1.0), 20001);
  EXPECT_EQ(x[1], 0.0);
  EXPECT_EQ(LeastSquaresReal(a, 3, 2, b, 1, x, 1e-25), 0);  // RCOND 3e-25 keeps 1e-20
  EXPECT_NEAR(x[1], 1.0, 1e-12);
  // The pseudo-inverse solves read a zero rcond as epsilon: 1e-20 is dropped.
  EXPECT_EQ(LeastSquaresPinvReal(a, 3, 2, b, 1, x, 0.0), 20001);
  EXPECT_EQ(x[1], 0.0);
  const Cx ac[6] = {1, 0, 0, 1e-20, 0, 0};
  const Cx bc[3] = {1, 1e-20, 1};
  Cx xc[2];
  EXPECT_EQ(LeastSquaresComplex(ac, 3, 2, bc, 1, xc, 0.0), 20001);
  EXPECT_EQ(xc[1], Cx(0.0));
  // A positive rcond is used as given: keep both, then drop the second.
  EXPECT_EQ(LeastSquaresPinvReal(a, 3, 2, b, 1, x, 1e-22), 0);
  EXPECT_NEAR(x[1], 1.0, 1e-12);
  EXPECT_EQ(LeastSquaresComplex(ac, 3, 2, bc, 1, xc, 1e-22), 0);
  EXPECT_NEAR(std::abs(xc[1] - 1.0), 0.0, 1e-12);
}

TEST(LeastSquares, ComplexGrowsItsBlockForManyRightHandSides) {
  for (int32_t nrhs : {1, 3, 4, 9}) {  // k = 3
    SCOPED_TRACE(nrhs);
    const auto a = qdm_test::RandomMatrix<Cx>(5, 3, 51);
    const auto b = qdm_test::RandomMatrix<Cx>(5, nrhs, 52);
    std::vector<Cx> x(static_cast<size_t>(3) * nrhs);
    ASSERT_EQ(LeastSquaresComplex(a.data(), 5, 3, b.data(), nrhs, x.data(), -1.0), 0);
    EXPECT_LT(NormalEquationError(a.data(), 5, 3, b.data(), nrhs, x.data()), 100.0);
  }
  // nrhs is not checked by the complex solve: none is nothing to do.
  const auto a = qdm_test::RandomMatrix<Cx>(5, 3, 53);
  Cx x = Cx(7.0), b = Cx(1.0);
  EXPECT_EQ(LeastSquaresComplex(a.data(), 5, 3, &b, 0, &x, -1.0), 0);
  EXPECT_EQ(x, Cx(7.0));
}

TEST(LeastSquares, BadInputWritesNothing) {
  const auto a = qdm_test::RandomMatrix<double>(4, 3, 61);
  const auto b = qdm_test::RandomMatrix<double>(4, 2, 62);
  struct Case {
    int32_t m, n, nrhs, bad_a, bad_b;  // index of a DBL_MAX / NaN entry, or -1
    StatusCode real, complex;
  } cases[] = {
      {0, 3, 2, -1, -1, -20003, -20003},   {4, 0, 2, -1, -1, -20003, -20003},
      {-2, 3, 2, -1, -1, -20003, -20003},  {4, 3, 0, -1, -1, -20003, 0},
      {4, 3, 2, 5, -1, -20068, -20068},    {4, 3, 2, -1, 7, -20068, -20068},
      {4, 3, -1, -1, -1, -20003, -20004},
  };
  for (const Case& c : cases) {
    for (double bad : {DBL_MAX, double(NAN), -double(INFINITY), -1.7976931348623e308}) {
      SCOPED_TRACE(::testing::Message() << c.m << "x" << c.n << " nrhs " << c.nrhs << " bad "
                                        << bad);
      auto ar = a, br = b;
      if (c.bad_a >= 0) ar[c.bad_a] = bad;
      if (c.bad_b >= 0) br[c.bad_b] = bad;
      std::vector<Cx> ac(ar.begin(), ar.end()), bc(br.begin(), br.end());
      if (c.bad_a >= 0) ac[c.bad_a] = Cx(0.5, bad);  // the imaginary part alone
      std::vector<double> x(6, 9.0);
      std::vector<Cx> xc(6, Cx(9.0));
      EXPECT_EQ(LeastSquaresReal(ar.data(), c.m, c.n, br.data(), c.nrhs, x.data(), -1.0), c.real);
      EXPECT_EQ(LeastSquaresPinvReal(ar.data(), c.m, c.n, br.data(), c.nrhs, x.data(), -1.0),
                c.real);
      EXPECT_EQ(LeastSquaresComplex(ac.data(), c.m, c.n, bc.data(), c.nrhs, xc.data(), -1.0),
                c.complex);
      for (double v : x) EXPECT_EQ(v, 9.0);
      for (const Cx& v : xc) EXPECT_EQ(v, Cx(9.0));
    }
  }
}

// ---- pseudo-inverse -----------------------------------------------------------------------

template <typename T>
StatusCode PinvNamed(T* A, int32_t m, int32_t n, double tol, T* out) {
  if constexpr (qdm_test::kIsCx<T>) {
    return PseudoInverseComplex(A, m, n, tol, out);
  } else {
    return PseudoInverseReal(A, m, n, tol, out);
  }
}

// The largest of the four Moore-Penrose residuals, each scaled by the size of
// its terms and max(m, n) eps.
template <typename T>
double MoorePenroseError(const std::vector<T>& A, const std::vector<T>& P, int32_t m, int32_t n) {
  const auto ap = NaiveProduct(A.data(), P.data(), m, n, m);    // m-by-m
  const auto pa = NaiveProduct(P.data(), A.data(), n, m, n);    // n-by-n
  const auto apa = NaiveProduct(ap.data(), A.data(), m, m, n);  // A
  const auto pap = NaiveProduct(pa.data(), P.data(), n, n, m);  // P
  const auto aph = NaiveAdjoint(ap.data(), m, m);
  const auto pah = NaiveAdjoint(pa.data(), n, n);
  const double na = qdm_test::FrobNorm(A.data(), int64_t{m} * n);
  const double np = qdm_test::FrobNorm(P.data(), int64_t{m} * n);
  const double unit = std::max(m, n) * kEps;
  const double e1 = qdm_test::FrobDiff(apa.data(), A.data(), int64_t{m} * n) / (na * na * np);
  const double e2 = qdm_test::FrobDiff(pap.data(), P.data(), int64_t{m} * n) / (np * np * na);
  const double e3 = qdm_test::FrobDiff(aph.data(), ap.data(), int64_t{m} * m) / (na * np);
  const double e4 = qdm_test::FrobDiff(pah.data(), pa.data(), int64_t{n} * n) / (na * np);
  return std::max({e1, e2, e3, e4}) / unit;
}

template <typename T>
class PinvTyped : public ::testing::Test {};
using Scalars = ::testing::Types<double, Cx>;
TYPED_TEST_SUITE(PinvTyped, Scalars);

TYPED_TEST(PinvTyped, MoorePenroseConditions) {
  using T = TypeParam;
  const Problem shapes[] = {{1, 1, 1, 0}, {2, 3, 2, 0}, {3, 2, 2, 0}, {5, 5, 5, 0},
                            {7, 4, 2, 0}, {4, 9, 1, 0}, {12, 5, 5, 0}, {22, 42, 22, 0}};
  for (const Problem& s : shapes) {
    SCOPED_TRACE(::testing::Message() << s.m << "x" << s.n << " rank " << s.rank);
    const auto a = MakeLowRank<T>(s.m, s.n, s.rank, 71).A;
    auto a_work = a;
    std::vector<T> p(a.size(), T(-1.0));
    ASSERT_EQ(PinvNamed(a_work.data(), s.m, s.n, -1.0, p.data()), 0);
    EXPECT_EQ(a_work, a);
    EXPECT_LT(MoorePenroseError(a, p, s.m, s.n), 30.0);
    ASSERT_EQ(PinvNamed(a_work.data(), s.m, s.n, -1.0, static_cast<T*>(nullptr)), 0);
    EXPECT_EQ(a_work, p);  // in place gives the same result
  }
}

TYPED_TEST(PinvTyped, InPlaceTwoByThree) {
  using T = TypeParam;
  // Rows orthogonal: pinv = A^H diag(1/|row|^2).
  std::vector<T> a = {T(1.0), T(2.0), T(2.0), T(2.0), T(1.0), T(-2.0)};
  if constexpr (qdm_test::kIsCx<T>) {  // rows (1, 2i, 2) and (2, i, -2)
    a[1] = T(0.0, 2.0);
    a[4] = T(0.0, 1.0);
  }
  const auto a0 = a;
  ASSERT_EQ(PinvNamed(a.data(), 2, 3, -1.0, static_cast<T*>(nullptr)), 0);
  const auto want = NaiveAdjoint(a0.data(), 2, 3);
  for (int32_t j = 0; j < 3; ++j) {
    for (int32_t i = 0; i < 2; ++i) {
      EXPECT_NEAR(std::abs(a[j * 2 + i] - want[j * 2 + i] / 9.0), 0.0, 1e-15);
    }
  }
}

TYPED_TEST(PinvTyped, ToleranceHandling) {
  using T = TypeParam;
  const std::vector<T> a = {T(1.0), T(0.0), T(0.0), T(1e-20), T(0.0), T(0.0)};  // 3-by-2
  struct Case {
    double tol, p00, p11;
  } cases[] = {{-1.0, 1.0, 0.0},  {0.0, 1.0, 1e20},  {1e-21, 1.0, 1e20},
               {1e-20, 1.0, 0.0}, {1.0, 0.0, 0.0},   {NAN, 0.0, 0.0}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.tol);
    auto work = a;
    std::vector<T> p(6, T(7.0));
    ASSERT_EQ(PinvNamed(work.data(), 3, 2, c.tol, p.data()), 0);
    EXPECT_EQ(p[0], T(c.p00));                                 // (0, 0)
    EXPECT_NEAR(std::abs(p[4] - T(c.p11)), 0.0, 1e-15 * c.p11);  // (1, 1)
    for (int i : {1, 2, 3, 5}) EXPECT_EQ(p[i], T(0.0));
  }
}

TYPED_TEST(PinvTyped, BadInputWritesNothing) {
  using T = TypeParam;
  for (auto [m, n, bad, want] : {std::tuple{0, 2, 0.0, -20003}, std::tuple{2, -1, 0.0, -20003},
                                 std::tuple{2, 2, double(NAN), -20068},
                                 std::tuple{2, 2, DBL_MAX, -20068}}) {
    std::vector<T> a = {T(1.0), T(2.0), T(3.0), T(bad)};
    const auto a0 = a;
    std::vector<T> p(4, T(7.0));
    EXPECT_EQ(PinvNamed(a.data(), m, n, -1.0, p.data()), want);
    EXPECT_EQ(PinvNamed(a.data(), m, n, -1.0, static_cast<T*>(nullptr)), want);
    for (const T& v : p) EXPECT_EQ(v, T(7.0));
    for (size_t i = 0; i < a.size(); ++i) {
      EXPECT_TRUE(a[i] == a0[i] || (std::isnan(std::real(a[i])) && std::isnan(std::real(a0[i]))));
    }
  }
}

// A tall system scaled to either end of the range has the solution and rank
// decision of the unscaled one: the QR steps do not rescale the way an SVD
// driver does, and must neither overflow nor lose the small values.
TEST(LeastSquares, TallSystemsNearTheEndsOfTheRange) {
  for (const Problem& p : {Problem{600, 12, 12, 1}, Problem{1500, 40, 12, 2}}) {
    for (int solver = 0; solver < 4; ++solver) {
      const auto a = MakeLowRank<double>(p.m, p.n, p.rank, 41).A;
      const auto b = qdm_test::RandomMatrix<double>(p.m, p.nrhs, 42);
      auto solve = [&](double scale, std::vector<Cx>& x) {
        std::vector<double> as(a), bs(b), xr(x.size());
        for (double& v : as) v *= scale;
        for (double& v : bs) v *= scale;
        const std::vector<Cx> ac(as.begin(), as.end()), bc(bs.begin(), bs.end());
        StatusCode st = 0;
        switch (solver) {
          case 0: st = LeastSquaresReal(as.data(), p.m, p.n, bs.data(), p.nrhs, xr.data(), -1.0); break;
          case 1: st = LeastSquaresPinvReal(as.data(), p.m, p.n, bs.data(), p.nrhs, xr.data(), -1.0); break;
          case 2: return LeastSquaresComplex(ac.data(), p.m, p.n, bc.data(), p.nrhs, x.data(), -1.0);
          default: st = LeastSquaresTruncatedReal(as.data(), p.m, p.n, bs.data(), p.nrhs, xr.data(), 3);
        }
        std::copy(xr.begin(), xr.end(), x.begin());
        return st;
      };
      std::vector<Cx> x1(static_cast<size_t>(p.n) * p.nrhs);
      const StatusCode st1 = solve(1.0, x1);
      for (double scale : {1e150, 1e-150}) {
        SCOPED_TRACE(::testing::Message() << p.m << "x" << p.n << " solver " << solver << " scale " << scale);
        std::vector<Cx> xs(x1.size());
        ASSERT_EQ(solve(scale, xs), st1);
        const double norm = qdm_test::FrobNorm(x1.data(), static_cast<int64_t>(x1.size()));
        for (size_t i = 0; i < x1.size(); ++i) EXPECT_LT(std::abs(xs[i] - x1[i]), 1e-11 * norm) << i;
      }
    }
  }
}

// ---- failed allocations ---------------------------------------------------------------------

TYPED_TEST(PinvTyped, FailedAllocationsLeaveOutputsUntouched) {
  using T = TypeParam;
  for (bool in_place : {false, true}) {
    for (bool persistent : {false, true}) {
      const auto a0 = MakeLowRank<T>(4, 6, 4, 81).A;
      auto a = a0;
      std::vector<T> p(a0.size(), T(7.0));
      const int64_t n = qdm_test::FailEachAllocation(
          [&] {
            a = a0;
            return PinvNamed(a.data(), 4, 6, -1.0, in_place ? nullptr : p.data());
          },
          [&] {
            EXPECT_EQ(a, a0);
            for (const T& v : p) EXPECT_EQ(v, T(7.0));
          },
          persistent);
      EXPECT_GE(n, 6);
    }
  }
}

TEST(LeastSquaresFaults, EveryAllocationOfEverySolve) {
  struct Case {
    const char* name;
    int32_t m, n, rank, nrhs;
  } cases[] = {{"dgelsd tall", 6, 4, 4, 2}, {"dgelsd wide", 3, 7, 3, 1},
               {"dgelsd deficient", 6, 4, 2, 2}, {"pinv path", 1, 800, 1, 1}};
  for (const Case& c : cases) {
    for (int solver = 0; solver < 3; ++solver) {
      for (int32_t nrhs : {c.nrhs, 5}) {  // 5 > k grows the complex block
        SCOPED_TRACE(::testing::Message() << c.name << " solver " << solver << " nrhs " << nrhs);
        const auto a = MakeLowRank<double>(c.m, c.n, c.rank, 91).A;
        const auto b = qdm_test::RandomMatrix<double>(c.m, nrhs, 92);
        const std::vector<Cx> ac(a.begin(), a.end()), bc(b.begin(), b.end());
        std::vector<double> x(static_cast<size_t>(c.n) * nrhs, 9.0);
        std::vector<Cx> xc(x.size(), Cx(9.0));
        const int64_t n = qdm_test::FailEachAllocation(
            [&] {
              switch (solver) {
                case 0: return LeastSquaresReal(a.data(), c.m, c.n, b.data(), nrhs, x.data(), -1.0);
                case 1:
                  return LeastSquaresPinvReal(a.data(), c.m, c.n, b.data(), nrhs, x.data(), -1.0);
                default:
                  return LeastSquaresComplex(ac.data(), c.m, c.n, bc.data(), nrhs, xc.data(), -1.0);
              }
            },
            [&] {
              for (double v : x) EXPECT_EQ(v, 9.0);
              for (const Cx& v : xc) EXPECT_EQ(v, Cx(9.0));
            },
            false, 0, 20001);
        EXPECT_GE(n, 5);
      }
    }
  }
}

}  // namespace
