// Oracles summed in long double that share no code with the library: A = U S V^H, normal
// equations and row space (minimum norm), Moore-Penrose, A^H A = R^H R, A V = V diag(w),
// plain loops, companion eigenvalues for the roots. One shape table, real and complex.

#include <gtest/gtest.h>

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <complex>
#include <functional>
#include <numbers>
#include <random>
#include <utility>
#include <vector>

#include "numeric/lapack_boundary.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

using Cx = std::complex<double>;
constexpr double kEps = 2.220446049250313e-16;
template <typename T>
constexpr bool kIsCx = !std::is_same_v<T, double>;

long double Widen(double v) { return v; }
std::complex<long double> Widen(Cx v) { return {v.real(), v.imag()}; }
double Narrow(long double v) { return double(v); }
Cx Narrow(std::complex<long double> v) { return {double(v.real()), double(v.imag())}; }
double Conj(double v) { return v; }
Cx Conj(Cx v) { return std::conj(v); }

// Uniform entries in [-1, 1] (both parts for complex). Row-major throughout.
template <typename T>
std::vector<T> Random(int64_t rows, int64_t cols, uint32_t seed) {
  std::mt19937_64 gen(seed);
  std::uniform_real_distribution<double> d(-1.0, 1.0);
  std::vector<T> a(static_cast<size_t>(rows * cols));
  for (T& v : a) {
    const double re = d(gen);
    if constexpr (kIsCx<T>)
      v = T(re, d(gen));
    else
      v = re;
  }
  return a;
}

// A (m-by-k) B (k-by-n).
template <typename T>
std::vector<T> Prod(const T* A, const T* B, int64_t m, int64_t k, int64_t n) {
  std::vector<T> c(static_cast<size_t>(m * n));
  for (int64_t i = 0; i < m; ++i)
    for (int64_t j = 0; j < n; ++j) {
      decltype(Widen(T())) s = 0;
      for (int64_t l = 0; l < k; ++l) s += Widen(A[i * k + l]) * Widen(B[l * n + j]);
      c[static_cast<size_t>(i * n + j)] = Narrow(s);
    }
  return c;
}

// The n-by-m conjugate transpose of the m-by-n A.
template <typename T>
std::vector<T> Adj(const T* A, int64_t m, int64_t n) {
  std::vector<T> t(static_cast<size_t>(m * n));
  for (int64_t i = 0; i < m; ++i)
    for (int64_t j = 0; j < n; ++j) t[static_cast<size_t>(j * m + i)] = Conj(A[i * n + j]);
  return t;
}

template <typename T>
double Diff(const std::vector<T>& a, const std::vector<T>& b) {
  long double s = 0;
  for (size_t i = 0; i < a.size(); ++i) s += std::norm(Widen(a[i]) - Widen(b[i]));
  return static_cast<double>(std::sqrt(s));
}
template <typename T>
double Norm(const std::vector<T>& a) {
  return Diff(a, std::vector<T>(a.size()));
}

// ||Q^H Q - I||_F for the m-by-c Q.
template <typename T>
double OrthError(const T* Q, int64_t m, int64_t c) {
  auto g = Prod(Adj(Q, m, c).data(), Q, c, m, c);
  for (int64_t i = 0; i < c; ++i) g[static_cast<size_t>(i * c + i)] -= T(1.0);
  return Norm(g);
}

struct Shape {
  int32_t m, n, rank, nrhs;
};

const Shape kShapes[] = {
    {1, 1, 1, 1},
    {5, 5, 5, 2},
    {6, 6, 3, 1},
    {7, 5, 5, 2},
    {10, 4, 4, 3},
    {5, 1, 1, 4},
    {12, 5, 2, 2},
    {1, 6, 1, 1},
    {3, 7, 3, 2},
    {8, 12, 3, 2},
    {22, 42, 22, 1},
    {40, 22, 22, 2},
    {2000, 40, 40, 2},
    {1500, 40, 12, 2},  // several row blocks of the QR fold
    // either side of the width where a real solve leaves DGELSD
    {1, 739, 1, 2},
    {1, 740, 1, 2},
    {2, 803, 2, 1},
};

// A = F Q, the `rank` rows of Q orthonormal (Gram-Schmidt): they span the row space of A.
template <typename T>
struct Problem {
  std::vector<T> A, Q;
};
template <typename T>
Problem<T> MakeProblem(const Shape& s, uint32_t seed) {
  Problem<T> p{{}, Random<T>(s.rank, s.n, seed)};
  for (int32_t i = 0; i < s.rank; ++i) {
    T* qi = p.Q.data() + int64_t{i} * s.n;
    for (int32_t j = 0; j < i; ++j) {
      const T* qj = p.Q.data() + int64_t{j} * s.n;
      decltype(Widen(T())) d = 0;
      for (int32_t l = 0; l < s.n; ++l) d += Widen(Conj(qj[l])) * Widen(qi[l]);
      for (int32_t l = 0; l < s.n; ++l) qi[l] -= Narrow(d) * qj[l];
    }
    const double norm = Norm(std::vector<T>(qi, qi + s.n));
    for (int32_t l = 0; l < s.n; ++l) qi[l] /= norm;
  }
  p.A = Prod(Random<T>(s.m, s.rank, seed + 1).data(), p.Q.data(), s.m, s.rank, s.n);
  return p;
}

template <typename R, typename X, typename P, typename... Args>
StatusCode Twin(R real, X complex, P* first, Args... rest) {
  if constexpr (kIsCx<std::remove_const_t<P>>)
    return complex(first, rest...);
  else
    return real(first, rest...);
}

const auto Svd = [](auto... a) { return Twin(SvdReal, SvdComplex, a...); };
const auto SvdRight = [](auto... a) { return SvdLeadingRight(a...); };
const auto QrHankel = [](auto... a) { return QrReduceHankel(a...); };
const auto Pinv = [](auto... a) { return Twin(PseudoInverseReal, PseudoInverseComplex, a...); };
const auto MatMul = [](auto... a) { return Twin(MatMulReal, MatMulComplex, a...); };
const auto Transpose = [](auto... a) { return Twin(TransposeReal, ConjTransposeComplex, a...); };

// DGELSD (real only), the pseudo-inverse solves and the truncated solve.
enum { kGelsd, kPinv, kTruncated };
template <typename T>
StatusCode Solve(int solver, const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs, T* X,
                 double rcond, int32_t keep) {
  if constexpr (kIsCx<T>)
    return solver == kTruncated ? LeastSquaresTruncated(A, m, n, B, nrhs, X, keep)
                                : LeastSquaresComplex(A, m, n, B, nrhs, X, rcond);
  else if (solver == kTruncated)
    return LeastSquaresTruncated(A, m, n, B, nrhs, X, keep);
  else if (solver == kPinv)
    return LeastSquaresPinvReal(A, m, n, B, nrhs, X, rcond);
  else
    return LeastSquaresReal(A, m, n, B, nrhs, X, rcond);
}
template <typename T>
constexpr int kFirstSolver = kIsCx<T> ? kPinv : kGelsd;

template <typename T>
class Dense : public ::testing::Test {};
using Scalars = ::testing::Types<double, Cx>;
TYPED_TEST_SUITE(Dense, Scalars);

// The largest Moore-Penrose residual, scaled by its terms' size and max(m, n) eps.
template <typename T>
double MoorePenroseError(const std::vector<T>& A, const std::vector<T>& P, int32_t m, int32_t n) {
  const auto ap = Prod(A.data(), P.data(), m, n, m), pa = Prod(P.data(), A.data(), n, m, n);
  const double na = Norm(A), np = Norm(P);
  return std::max({Diff(Prod(ap.data(), A.data(), m, m, n), A) / (na * na * np),
                   Diff(Prod(pa.data(), P.data(), n, n, m), P) / (np * np * na),
                   Diff(Adj(ap.data(), m, m), ap) / (na * np),
                   Diff(Adj(pa.data(), n, n), pa) / (na * np)}) /
         (std::max(m, n) * kEps);
}

// SVD, pseudo-inverse, the solves and the QR fold over the shape table.
TYPED_TEST(Dense, ShapeTableIdentities) {
  using T = TypeParam;
  for (const Shape& s : kShapes) {
    SCOPED_TRACE(::testing::Message() << s.m << "x" << s.n << " rank " << s.rank);
    const int32_t k = std::min(s.m, s.n);
    const Problem<T> p = MakeProblem<T>(s, 31);
    auto a = p.A;
    if (int64_t{s.m} * s.n <= 2000) {  // Moore-Penrose, A kept, P over A when null
      std::vector<T> pa(a.size(), T(-1.0));
      ASSERT_EQ(Pinv(a.data(), s.m, s.n, -1.0, pa.data()), 0);
      EXPECT_TRUE(a == p.A && MoorePenroseError(p.A, pa, s.m, s.n) < 30.0);
      ASSERT_EQ(Pinv(a.data(), s.m, s.n, -1.0, static_cast<T*>(nullptr)), 0);
      EXPECT_EQ(a, pa);
      a = p.A;
    }
    for (int32_t full : {0, 1}) {
      if (full != 0 && std::max(s.m, s.n) > 50) continue;
      const int32_t w = full != 0 ? s.m : k, q = full != 0 ? s.n : k;
      std::vector<T> u(size_t(s.m) * w, T(-7.0)), v(size_t(s.n) * q, T(-7.0));
      std::vector<double> sv(k, -7.0);
      ASSERT_EQ(Svd(a.data(), s.m, s.n, u.data(), sv.data(), v.data(), full), 0);
      for (int32_t i = 0; i < k; ++i) EXPECT_GE(sv[i], i + 1 < k ? sv[i + 1] : 0.0);
      EXPECT_LT(s.rank < k ? sv[s.rank] : 0.0, 1e-12 * sv[0]);
      std::vector<T> us(size_t(s.m) * k), vk(size_t(s.n) * k);
      for (int32_t i = 0; i < s.m * k; ++i) us[i] = u[i / k * w + i % k] * sv[i % k];
      for (int32_t i = 0; i < s.n * k; ++i) vk[i] = v[i / k * q + i % k];
      const auto vh = Adj(vk.data(), s.n, k);
      const double unit = Norm(a) * std::max(s.m, s.n) * kEps;
      EXPECT_LT(Diff(Prod(us.data(), vh.data(), s.m, k, s.n), a) / unit, 30.0);
      EXPECT_LT(OrthError(u.data(), s.m, w) / (s.m * kEps), 30.0);
      EXPECT_LT(OrthError(v.data(), s.n, q) / (s.n * kEps), 30.0);
      if (full != 0) continue;
      // The leading `rank` triplets: those of the economy decomposition.
      const int32_t c = s.rank;
      std::vector<T> lu(size_t(s.m) * c), lv(size_t(s.n) * c), want_u, want_v, rv(lv);
      std::vector<double> ls(c), rs(c);
      ASSERT_EQ(SvdLeading(a.data(), s.m, s.n, c, lu.data(), ls.data(), lv.data()), 0);
      for (int32_t i = 0; i < s.m; ++i) want_u.insert(want_u.end(), &u[i * k], &u[i * k] + c);
      for (int32_t i = 0; i < s.n; ++i) want_v.insert(want_v.end(), &v[i * k], &v[i * k] + c);
      EXPECT_TRUE(lu == want_u && lv == want_v && ls == std::vector<double>(&sv[0], &sv[0] + c));
      // Without U: orthonormal V with |A v_j| = s_j are the leading right vectors.
      ASSERT_EQ(SvdRight(a.data(), s.m, s.n, c, rs.data(), rv.data()), 0);
      EXPECT_LT(OrthError(rv.data(), s.n, c) / (s.n * kEps), 30.0);
      const auto av = Prod(a.data(), rv.data(), s.m, s.n, c);
      for (int32_t j = 0; j < c; ++j) {
        long double col = 0;
        for (int32_t i = 0; i < s.m; ++i) col += std::norm(Widen(av[i * c + j]));
        EXPECT_NEAR(rs[j], sv[j], 1e-12 * sv[0]);
        EXPECT_NEAR(static_cast<double>(std::sqrt(col)), sv[j], 1e-12 * sv[0]);
      }
    }
    const auto b = Random<T>(s.m, s.nrhs, 32);
    const auto ah = Adj(p.A.data(), s.m, s.n), qh = Adj(p.Q.data(), s.rank, s.n);
    for (int solver = kFirstSolver<T>; solver <= kTruncated; ++solver) {
      SCOPED_TRACE(solver);
      // The truncated solve keeping `rank` values reports no rank warning. Scaled to
      // either end of the range, a system tall enough for the QR fold keeps its solution
      // and rank decision: no overflow, no small values lost.
      const int32_t want = s.rank < k && solver != kTruncated ? 20001 : 0;
      std::vector<T> x(size_t(s.n) * s.nrhs, T(-5.0)), x1;
      for (double scale : {1.0, 1e150, 1e-150}) {
        if (scale != 1.0 && s.m < 600) break;
        auto as = p.A, bs = b;
        for (auto* z : {&as, &bs})
          for (T& v : *z) v *= scale;
        ASSERT_EQ(Solve(solver, as.data(), s.m, s.n, bs.data(), s.nrhs, x.data(), -1.0, s.rank),
                  want)
            << scale;
        if (scale == 1.0) x1 = x;
        EXPECT_LT(Diff(x, x1), 1e-11 * Norm(x1)) << scale;
      }
      // ||A^H (A X - B)|| against ||A|| (||A|| ||X|| + ||B||) max(m, n) eps, and X in the row
      // space of A (zero distance for the minimum-norm solution).
      auto res = Prod(p.A.data(), x1.data(), s.m, s.n, s.nrhs);
      for (size_t i = 0; i < res.size(); ++i) res[i] -= b[i];
      const double na = Norm(p.A), ne = Norm(Prod(ah.data(), res.data(), s.n, s.m, s.nrhs));
      EXPECT_LT(ne / (na * (na * Norm(x1) + Norm(b)) * std::max(s.m, s.n) * kEps), 100.0);
      const auto qx = Prod(p.Q.data(), x1.data(), s.rank, s.n, s.nrhs);
      EXPECT_LT(Diff(Prod(qh.data(), qx.data(), s.n, s.rank, s.nrhs), x1), 1e-10 * Norm(x1));
    }
    // R of the Hankel block of a record, H[i][j] = x[i+n-1-j], never formed: H^H H = R^H R.
    const auto x = Random<T>(1, s.m + s.n - 1, 33);
    std::vector<T> h(size_t(s.m) * s.n), r(size_t(s.n) * s.n, T(7.0));
    for (int32_t i = 0; i < s.m; ++i)
      for (int32_t j = 0; j < s.n; ++j) h[size_t(i) * s.n + j] = x[i + s.n - 1 - j];
    ASSERT_EQ(QrHankel(x.data(), s.m, s.n, r.data()), s.m < s.n ? -20003 : 0);
    if (s.m < s.n) continue;
    for (int32_t i = 0; i < s.n; ++i)
      for (int32_t j = 0; j < i; ++j) EXPECT_EQ(r[i * s.n + j], T(0.0));
    const auto rh = Adj(r.data(), s.n, s.n), hh = Adj(h.data(), s.m, s.n);
    const double unit = Norm(h) * s.m * kEps;
    EXPECT_LT(
        Diff(Prod(hh.data(), h.data(), s.n, s.m, s.n), Prod(rh.data(), r.data(), s.n, s.n, s.n)) /
            (unit * Norm(h)),
        30.0);
  }
}

// Singular values 1 and 1e-20 exactly: which of them a threshold keeps, and the
// rank warning that goes with it. An all-zero A keeps none.
TYPED_TEST(Dense, ThresholdsAndRankDecisions) {
  using T = TypeParam;
  const std::vector<T> a = {T(1.0), T(0.0), T(0.0), T(1e-20), T(0.0), T(0.0)}, zero(6, T(0.0)),
                       b = {T(1.0), T(1e-20), T(1.0)};
  // rcond: the truncated solve's keep; x1 is 1 when 1e-20 is kept. DGELSD gets max(m, n) rcond,
  // or max(m, n) eps for a negative or NaN rcond; the pinv solves read zero as eps too.
  const struct {
    int solver;
    double rcond;
    int32_t want;
    double x1;
  } cases[] = {{kGelsd, -1.0, 20001, 0.0}, {kGelsd, NAN, 20001, 0.0}, {kGelsd, 1e-25, 0, 1.0},
               {kPinv, 0.0, 20001, 0.0},   {kPinv, -1.0, 20001, 0.0}, {kPinv, 1e-22, 0, 1.0},
               {kTruncated, 1, 0, 0.0},    {kTruncated, 2, 0, 1.0}};
  for (const auto& c : cases) {
    if (kIsCx<T> && c.solver == kGelsd) continue;
    SCOPED_TRACE(::testing::Message() << c.solver << " " << c.rcond);
    const int32_t keep = c.solver == kTruncated ? static_cast<int32_t>(c.rcond) : 0;
    std::vector<T> x(2, T(9.0));
    EXPECT_EQ(Solve(c.solver, a.data(), 3, 2, b.data(), 1, x.data(), c.rcond, keep), c.want);
    EXPECT_NEAR(std::abs(x[0] - T(1.0)), 0.0, 1e-15);
    EXPECT_NEAR(std::abs(x[1] - T(c.x1)), 0.0, 1e-12);
    EXPECT_EQ(Solve(c.solver, zero.data(), 3, 2, b.data(), 1, x.data(), c.rcond, keep),
              c.solver == kTruncated ? 0 : 20001);
    EXPECT_EQ(x, std::vector<T>(2, T(0.0)));
  }
  // pinv tolerance: negative selects max(m, n) S[0] eps; any other used as given.
  for (auto [tol, p00, p11] : {std::tuple{-1.0, 1.0, 0.0},
                               {0.0, 1.0, 1e20},
                               {1e-21, 1.0, 1e20},
                               {1e-20, 1.0, 0.0},
                               {1.0, 0.0, 0.0},
                               {NAN, 0.0, 0.0}}) {
    auto work = a;
    std::vector<T> p(6, T(7.0));
    ASSERT_EQ(Pinv(work.data(), 3, 2, tol, p.data()), 0);
    EXPECT_EQ(p, (std::vector<T>{T(p00), T(0.0), T(0.0), T(0.0), T(p11), T(0.0)})) << tol;
  }
  const double s[3] = {4.0, 2.0, 1.0};
  for (auto [keep, want] : {std::pair{1, 3.0}, {2, 1.5}, {3, 0.5}, {0, 0.0}, {4, 0.0}, {-1, 0.0}})
    EXPECT_EQ(TruncationThreshold(s, 3, keep), want) << keep;
}

// The forward prediction solve, folded straight from the record when tall, gives the formed
// system's solve bit for bit, status included: several fold blocks, either side of tall, a
// constant record (rank 1) and a NaN.
TYPED_TEST(Dense, ForwardSolveIsTheFormedSolve) {
  using T = TypeParam;
  for (auto [n, p, kind] : {std::tuple{9000, 16, 0},
                            {36, 12, 0},
                            {35, 12, 0},
                            {200, 10, 1},
                            {200, 10, 2},
                            {9000, 16, 3},
                            {1000, 7, 3}}) {
    SCOPED_TRACE(::testing::Message() << n << " " << p << " " << kind);
    auto x = Random<T>(1, n, 41);
    if (kind == 1) x.assign(n, T(1.0));
    if (kind == 2) x[150] = T(NAN);
    if (kind == 3) {  // three tones under a faint floor: cond(A) far above 1e4
      for (int32_t k = 0; k < n; ++k) {
        const double t = k;
        x[k] = x[k] * 1e-7 + T(std::cos(0.05 * t) + 0.5 * std::cos(0.11 * t + 1.0) +
                               0.25 * std::cos(0.19 * t + 2.0));
      }
    }
    const int32_t m = n - p;
    std::vector<T> a(size_t(m) * p), w(p, T(7.0)), want(p, T(7.0));
    for (int32_t i = 0; i < m; ++i)
      for (int32_t j = 0; j < p; ++j) a[size_t(i) * p + j] = x[i + p - 1 - j];
    const StatusCode got = ForwardLeastSquares(x.data(), n, p, w.data(), -1.0);
    EXPECT_EQ(got, Solve(kFirstSolver<T>, a.data(), m, p, x.data() + p, 1, want.data(), -1.0, 0));
    EXPECT_EQ(got, kind == 0 || kind == 3 ? 0 : kind == 1 ? 20001 : -20068);
    EXPECT_EQ(w, want);
  }
}

// A long, badly conditioned system with an exactly known answer: every column is one
// large Gaussian-integer run (up to 1e6) plus its own small integer wobble (|parts| <= 2),
// so cond(A) is about 1e6, and b = A w for a Gaussian-integer w is exact in double. The
// solve must give w to about eps cond(A) / 100, however many row blocks the fold takes.
// (Without a correction step the fold's error grows with the blocks: 4e-12 and 1e-11 here.) The
// complex pseudo-inverse solve takes the step; the real DGELSD one does not.
TEST(DenseComplex, LongIllConditionedSystemWithAnExactAnswer) {
  using T = Cx;
  for (auto [m, n] : {std::pair{6000, 8}, {40000, 12}}) {
    SCOPED_TRACE(::testing::Message() << m << "x" << n);
    std::mt19937_64 gen(51);
    std::uniform_int_distribution<int> base(-1000000, 1000000), wobble(-2, 2), coef(-9, 9);
    const auto draw = [&](auto& d) {
      if constexpr (kIsCx<T>)
        return T(d(gen), d(gen));
      else
        return T(d(gen));
    };
    std::vector<T> a(size_t(m) * n), w(n), b(m), x(n, T(7.0));
    for (T& v : w) v = draw(coef);
    for (int32_t i = 0; i < m; ++i) {
      const T row = draw(base);
      for (int32_t j = 0; j < n; ++j) a[size_t(i) * n + j] = row + draw(wobble);
    }
    b = Prod(a.data(), w.data(), m, n, 1);  // integers below 2^31: exact
    ASSERT_EQ(Solve(kFirstSolver<T>, a.data(), m, n, b.data(), 1, x.data(), -1.0, 0), 0);
    EXPECT_LT(Diff(x, w) / Norm(w), 1e-14);
  }
}

// An injected driver failure reaches each caller as the status its INFO maps to, nothing
// written. A real solve leaves DGELSD past a width that grows with the rows: an INFO < 0
// shows the way, a rank-0 solve in DGELSD (its rank decides), a failure in an SVD.
TEST(LapackBoundary, InjectedInfoMapsPerDriver) {
  const auto a = Random<double>(10, 1387, 5), b = Random<double>(10, 1, 6);
  const std::vector<Cx> ac(a.begin(), a.end()), bc(b.begin(), b.end());
  std::vector<double> u(24, 7.0), s(4, 7.0), v(16, 7.0), x(1387, 7.0), sym(16, 1.0);
  std::vector<Cx> w(4, Cx(7.0)), vec(16, Cx(7.0));
  int32_t m = 0, n = 0;
  const std::function<StatusCode()> calls[] = {
      [&] { return SvdReal(a.data(), 6, 4, u.data(), s.data(), v.data(), 0); },
      [&] { return EigGeneralReal(a.data(), 4, 1, w.data(), vec.data()); },
      [&] { return LeastSquaresReal(a.data(), m, n, b.data(), 1, x.data(), -1.0); },
      [&] { return LeastSquaresComplex(ac.data(), 6, 2, bc.data(), 1, w.data(), -1.0); },
      [&] { return EigSymReal(sym.data(), 4, 0, s.data(), nullptr); },
  };
  // call, INFO, status; persistent (the failure stays armed), m, n for the real solve
  const struct {
    int call;
    int32_t info;
    int32_t want;
    int persistent, m, n;
  } cases[] = {{0, 3, -20062, 0, 0, 0},     {0, -2, -20062, 0, 0, 0},    {1, 1, -20062, 0, 0, 0},
               {1, -4, -20999, 0, 0, 0},    {3, -1, -20999, 0, 0, 0},    {4, 5, -20062, 0, 0, 0},
               {0, 1, -20062, 1, 0, 0},     {2, 2, -20062, 0, 3, 4},     {2, -3, 20001, 0, 3, 4},
               {2, -3, 20001, 0, 1, 739},   {2, -3, -20062, 0, 1, 740},  {2, -3, 20001, 0, 2, 802},
               {2, -3, -20062, 0, 2, 803},  {2, -3, 20001, 0, 3, 868},   {2, -3, -20062, 0, 3, 869},
               {2, -3, 20001, 0, 10, 1386}, {2, -3, -20062, 0, 10, 1387}};
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.call << " INFO " << c.info << " " << c.m << "x" << c.n);
    u.assign(u.size(), 7.0), x.assign(x.size(), 7.0);
    LapackFailAt(1, c.info, c.persistent != 0);
    m = c.m, n = c.n;
    const StatusCode st = calls[c.call]();
    EXPECT_EQ(LapackCalls(), 1);
    LapackFailAt(0, 0, false);
    EXPECT_EQ(st, c.want);
    const bool untouched = u == std::vector<double>(24, 7.0) && vec == std::vector<Cx>(16, 7.0);
    EXPECT_TRUE(c.want >= 0 || (untouched && x == std::vector<double>(x.size(), 7.0)));
  }
}

TYPED_TEST(Dense, BadInputIsRefusedWithNothingWritten) {
  using T = TypeParam;
  const auto a = Random<double>(4, 3, 61), b = Random<double>(4, 2, 62);
  // bad_a, bad_b: index of a non-finite entry, or -1; complex: the complex
  // pseudo-inverse solve, which leaves nrhs to the factorization.
  const struct {
    int32_t m, n, nrhs, bad_a, bad_b;
    int32_t real, complex;
  } cases[] = {{0, 3, 2, -1, -1, -20003, -20003},  {4, 0, 2, -1, -1, -20003, -20003},
               {-2, 3, 2, -1, -1, -20003, -20003}, {4, 3, 0, -1, -1, -20003, 0},
               {4, 3, -1, -1, -1, -20003, -20004}, {4, 3, 2, 5, -1, -20068, -20068},
               {4, 3, 2, -1, 7, -20068, -20068}};
  for (const auto& c : cases) {
    for (double bad : {DBL_MAX, std::nan(""), -HUGE_VAL, -1.7976931348623e308}) {
      SCOPED_TRACE(::testing::Message() << c.m << "x" << c.n << " nrhs " << c.nrhs << " " << bad);
      std::vector<T> at(a.begin(), a.end()), bt(b.begin(), b.end());
      if (c.bad_a >= 0) {
        if constexpr (kIsCx<T>)
          at[c.bad_a] = T(0.5, bad);  // the imaginary part alone
        else
          at[c.bad_a] = bad;
      }
      if (c.bad_b >= 0) bt[c.bad_b] = T(bad);
      for (int solver = kFirstSolver<T>; solver <= kTruncated; ++solver) {
        std::vector<T> x(6, T(9.0));
        const int32_t want = kIsCx<T> && solver == kPinv ? c.complex : c.real;
        EXPECT_EQ(Solve(solver, at.data(), c.m, c.n, bt.data(), c.nrhs, x.data(), -1.0, 1), want);
        EXPECT_EQ(x, std::vector<T>(6, T(9.0)));
      }
      if (c.nrhs != 2 || c.bad_b >= 0) continue;  // the decompositions, on the same A
      std::vector<T> u(16, T(7.0)), v(9, T(7.0)), p(12, T(7.0));
      std::vector<double> sv(3, 7.0);
      EXPECT_EQ(Svd(at.data(), c.m, c.n, u.data(), sv.data(), v.data(), 1), c.real);
      EXPECT_EQ(SvdRight(at.data(), c.m, c.n, 1, sv.data(), v.data()), c.real);
      EXPECT_EQ(Pinv(at.data(), c.m, c.n, -1.0, p.data()), c.real);
      for (const auto* out : {&u, &v, &p}) EXPECT_EQ(*out, std::vector<T>(out->size(), T(7.0)));
      EXPECT_EQ(sv, std::vector<double>(3, 7.0));
    }
  }
}

TYPED_TEST(Dense, ProductsAndTransposesMatchLoops) {
  using T = TypeParam;
  // 3061 rows: two 1530-row blocks of the real product and one row left over.
  for (auto [m, k, n] : {std::tuple{1, 1, 1}, {7, 9, 1}, {33, 17, 65}, {3061, 300, 4}}) {
    SCOPED_TRACE(::testing::Message() << m << "x" << k << "x" << n);
    const auto a = Random<T>(m, k, 1), b = Random<T>(k, n, 2);
    std::vector<T> c(size_t(m) * n, T(NAN));  // never read
    ASSERT_EQ(MatMul(a.data(), b.data(), m, k, n, c.data()), 0);
    EXPECT_LT(Diff(c, Prod(a.data(), b.data(), m, k, n)) / (Norm(c) * k * kEps), 4.0);
    auto src = a, t = a;
    ASSERT_EQ(Transpose(src.data(), m, k, t.data()), 0);
    EXPECT_EQ(t, Adj(a.data(), m, k));
    ASSERT_EQ(Transpose(src.data(), m, k, static_cast<T*>(nullptr)), 0);
    EXPECT_EQ(src, t);
  }
  // An empty inner dimension gives NaN (both parts), an empty result nothing.
  const T one(1.0);
  std::vector<T> c(6, T(7.0));
  ASSERT_EQ(MatMul(&one, &one, 2, 0, 3, c.data()), 0);
  for (T v : c) EXPECT_TRUE(std::isnan(std::real(v)) && std::isnan(std::imag(v)) == kIsCx<T>);
  for (auto [m, k, n, want] : {std::tuple{0, 3, 2, 0},
                               {2, 3, 0, 0},
                               {2, 3, -1, -20004},
                               {-1, 3, 2, -20004},
                               {2, -1, 2, -20004},
                               {0, -2, 0, -20004}}) {
    T out(42.0);
    EXPECT_EQ(MatMul(&one, &one, m, k, n, &out), want) << m << "x" << k << "x" << n;
    EXPECT_EQ(out, T(42.0));
  }
  T x(1.0);
  for (auto [m, n] : {std::pair{0, 3}, {3, 0}, {-1, 2}})
    EXPECT_EQ(Transpose(&x, m, n, &x) + Transpose(&x, m, n, static_cast<T*>(nullptr)), -40006);
  EXPECT_EQ(NumAllocOutstanding(), 0);
}

// ||A V - V diag(w)||_F / (||A||_F n eps), all row-major n-by-n.
double EigResidual(const std::vector<Cx>& A, const std::vector<Cx>& V, const std::vector<Cx>& w,
                   int n) {
  auto av = Prod(A.data(), V.data(), n, n, n);
  for (int i = 0; i < n * n; ++i) av[i] -= V[i] * w[i % n];
  return Norm(av) / (Norm(A) * n * kEps);
}
template <typename R>
std::vector<Cx> ToCx(const std::vector<R>& x) {
  return {x.begin(), x.end()};
}

TEST(Eigen, ResidualsOrderWhereVectorsGoAndRefusals) {
  for (int n : {1, 2, 3, 5, 8, 13, 24}) {
    SCOPED_TRACE(n);
    const size_t nn = size_t(n) * n;
    const auto g = Random<double>(n, n, n), gt = Adj(g.data(), n, n);
    const auto gc = Random<Cx>(n, n, n + 100), gh = Adj(gc.data(), n, n);
    auto sym = g;
    auto her = gc;
    for (size_t i = 0; i < nn; ++i) sym[i] += gt[i], her[i] += gh[i];
    // General real: unit right vectors, conjugate pairs positive imaginary part first.
    std::vector<Cx> w(n), V(nn), w0(n);
    ASSERT_EQ(EigGeneralReal(g.data(), n, 1, w.data(), V.data()), 0);
    EXPECT_LT(EigResidual(ToCx(g), V, w, n), 30.0);
    const auto gram = Prod(Adj(V.data(), n, n).data(), V.data(), n, n, n);
    for (int j = 0; j < n; ++j) {
      EXPECT_NEAR(gram[j * n + j].real(), 1.0, 1e-13);
      const int pair = w[j].imag() > 0 && j + 1 < n;  // a conjugate pair, or a real value
      EXPECT_EQ(w[j + pair], std::conj(w[j]));
      j += pair;
    }
    ASSERT_EQ(EigGeneralReal(g.data(), n, 0, w0.data(), nullptr), 0);  // values alone
    EXPECT_LT(Diff(w0, w), 1e-10 * (1 + Norm(w)));
    // General complex: vectors into their argument, or over A when it is null.
    auto a = gc;
    ASSERT_EQ(EigGeneralComplex(a.data(), n, 1, w.data(), V.data()), 0);
    EXPECT_EQ(a, gc);
    EXPECT_LT(EigResidual(gc, V, w, n), 30.0);
    ASSERT_EQ(EigComplex(a.data(), n, 0, 1, w0.data(), nullptr), 0);
    EXPECT_TRUE(w0 == w && a == V);
    // Symmetric: ascending, orthonormal; vectors over A when null, A kept without.
    std::vector<double> ws(n), Vs(nn), as = sym;
    ASSERT_EQ(EigSymReal(as.data(), n, 1, ws.data(), Vs.data()), 0);
    EXPECT_TRUE(std::is_sorted(ws.begin(), ws.end()));
    EXPECT_LT(EigResidual(ToCx(sym), ToCx(Vs), ToCx(ws), n), 30.0);
    EXPECT_LT(OrthError(Vs.data(), n, n) / (n * kEps), 30.0);
    ASSERT_EQ(EigSymReal(as.data(), n, 0, ws.data(), nullptr), 0);
    EXPECT_EQ(as, sym);
    ASSERT_EQ(EigSymReal(as.data(), n, 1, ws.data(), nullptr), 0);
    EXPECT_EQ(as, Vs);
    // Hermitian, and the complex front end's Hermitian branch: (w, 0) values.
    std::vector<double> wh(n);
    std::vector<Cx> Vh(nn), ah = her;
    ASSERT_EQ(EigHermitianComplex(her.data(), n, 1, wh.data(), Vh.data()), 0);
    EXPECT_TRUE(std::is_sorted(wh.begin(), wh.end()));
    EXPECT_LT(EigResidual(her, Vh, ToCx(wh), n), 30.0);
    EXPECT_LT(OrthError(Vh.data(), n, n) / (n * kEps), 30.0);
    ASSERT_EQ(EigComplex(ah.data(), n, 1, 1, w.data(), nullptr), 0);
    EXPECT_TRUE(w == ToCx(wh) && ah == Vh);
  }
  // Sizes, the option flags and non-finite input, for every front end.
  double rd[4] = {1, 2, 2, 1}, rw[2], rv[4];
  Cx cd[4] = {1, 2, 2, 1}, cw[2], cv[4];
  const std::function<StatusCode(int32_t, int32_t)> calls[] = {
      [&](int32_t n, int32_t v) { return EigGeneralReal(rd, n, v, cw, cv); },
      [&](int32_t n, int32_t v) { return EigGeneralComplex(cd, n, v, cw, cv); },
      [&](int32_t n, int32_t v) { return EigSymReal(rd, n, v, rw, rv); },
      [&](int32_t n, int32_t v) { return EigHermitianComplex(cd, n, v, rw, cv); },
      [&](int32_t n, int32_t v) { return EigComplex(cd, n, 0, v, cw, cv); },
      [&](int32_t n, int32_t v) { return EigComplex(cd, n, 1, v, cw, cv); },
  };
  for (size_t i = 0; i < std::size(calls); ++i) {
    SCOPED_TRACE(i);
    EXPECT_EQ(calls[i](0, 0) + calls[i](-2, 1), -40006);
    EXPECT_EQ(calls[i](2, 2), status::kBadOption);
    EXPECT_EQ(calls[i](2, 1), 0);
    rd[3] = NAN, cd[3] = Cx(1, INFINITY);
    EXPECT_EQ(calls[i](2, 0), -20068);
    rd[3] = 1, cd[3] = 1;
  }
  for (int flag : {-1, 2}) EXPECT_EQ(EigComplex(cd, 2, flag, 0, cw, nullptr), status::kBadOption);
}

const double kNaN = std::nan("");

// Eigenvalues of the companion matrix of c[0] + ... + c[m] z^m.
std::vector<Cx> CompanionRoots(const std::vector<Cx>& c) {
  const int m = static_cast<int>(c.size()) - 1;
  std::vector<Cx> a(size_t(m) * m), w(m);
  for (int j = 0; j < m; ++j) a[j] = -c[m - 1 - j] / c[m];
  for (int i = 1; i < m; ++i) a[size_t(i) * m + i - 1] = 1;
  EXPECT_EQ(EigGeneralComplex(a.data(), m, 0, w.data(), nullptr), 0);
  return w;
}

// Every expected root has its own computed root within tol max(1, |root|).
void ExpectSameMultiset(std::vector<Cx> got, const std::vector<Cx>& want, double tol) {
  ASSERT_EQ(got.size(), want.size());
  for (const Cx& w : want) {
    const auto closer = [&](const Cx& x, const Cx& y) { return abs(x - w) < abs(y - w); };
    const auto best = std::min_element(got.begin(), got.end(), closer);
    EXPECT_LT(std::abs(*best - w), tol * std::max(1.0, std::abs(w))) << "root " << w;
    got.erase(best);
  }
}

StatusCode Roots(const std::vector<Cx>& c, std::vector<Cx>* roots, int32_t max_iterations = 1000) {
  roots->assign(c.size() > 1 ? c.size() - 1 : 1, Cx(-99, -99));
  return PolyRootsComplex(c.data(), static_cast<int32_t>(c.size()), max_iterations, roots->data());
}

// prod (z - r), lowest order first.
std::vector<Cx> FromRoots(const std::vector<Cx>& r) {
  std::vector<Cx> c = {1};
  for (const Cx& z : r) {
    std::vector<Cx> next(c.size() + 1, 0);
    for (size_t k = 0; k < c.size(); ++k) next[k + 1] += c[k], next[k] -= z * c[k];
    c = next;
  }
  return c;
}

TEST(PolyRoots, CompanionEigenvaluesSmallResidualsClosedFormsAndRefusals) {
  std::mt19937_64 rng(20240611);
  std::normal_distribution<double> g;
  for (int degree = 1; degree <= 40; ++degree)
    for (int trial = 0; trial < 3; ++trial) {
      std::vector<Cx> c(degree + 1), roots;
      for (Cx& v : c) v = Cx(g(rng), g(rng));
      if (trial == 2) c[0] = 0;  // a zero root too, written over the coefficients
      ASSERT_EQ(Roots(c, &roots), 0) << "degree " << degree;
      ExpectSameMultiset(roots, CompanionRoots(c), 1e-7);
      for (const Cx& z : roots) {  // |p(z)| relative to the size of its terms
        Cx p = 0;
        double scale = 0;
        for (int k = degree; k >= 0; --k) p = p * z + c[k], scale = scale * abs(z) + abs(c[k]);
        EXPECT_LE(std::abs(p), 1e-10 * scale) << "degree " << degree << " root " << z;
      }
    }
  // Autoregressive polynomials: conjugate pairs of poles near the unit circle.
  std::uniform_real_distribution<double> radius(0.5, 0.999), angle(0.05, 3.0);
  for (int pairs = 2; pairs <= 12; ++pairs) {
    std::vector<Cx> poles, roots;
    for (int i = 0; i < pairs; ++i) poles.push_back(std::polar(radius(rng), angle(rng)));
    for (int i = 0; i < pairs; ++i) poles.push_back(std::conj(poles[i]));
    ASSERT_EQ(Roots(FromRoots(poles), &roots), 0);
    ExpectSameMultiset(roots, poles, 1e-6);
  }
  // Multiple roots, to the accuracy their multiplicity allows.
  for (auto [roots_in, tol] : {std::pair{std::vector<Cx>{1, 1, 1, -2}, 1e-4},
                               {{1, 1, 2, 2}, 1e-6},
                               {{Cx(0, 1), Cx(0, 1), Cx(0, 1), Cx(0, 1)}, 1e-3},
                               {{-.5, -.5, -.5, -.5, -.5}, 1e-2}}) {
    std::vector<Cx> roots;
    ASSERT_EQ(Roots(FromRoots(roots_in), &roots), 0);
    ExpectSameMultiset(roots, roots_in, tol);
  }
  // Roots exact and in their order; unwritten entries stay -99 - 99i.
  // A zero leading coefficient (roots at infinity) and NaN are refused before any root.
  const int32_t bad = status::kBadPolynomial;
  const struct {
    std::vector<Cx> c;
    int32_t status;
    std::vector<Cx> roots;
  } cases[] = {{{0, 0, 1}, 0, {0, 0}},
               {{-2, 1}, 0, {2}},
               {{2, -3, 1}, 0, {2, 1}},
               {{1, 0, 0}, bad, {}},
               {{0, 0, 0, -2, 1, 0}, 0, {0, 0, 0, 2}},
               {{0, 6, -5, 1}, 0, {0, 3, 2}},
               {{5}, bad, {}},
               {{Cx(0, 2), Cx(0, -2)}, 0, {1}},
               {{0, 0}, bad, {}},
               {{0, 3}, 0, {0}},
               {{4, 0, 1}, 0, {Cx(0, -2), Cx(0, 2)}},
               {{0, 0, kNaN, 2, 3}, bad, {}},
               {{0, 0, 1, Cx(0, kNaN), 3}, bad, {}}};
  for (auto [c, status, want] : cases) {
    std::vector<Cx> roots;
    ASSERT_EQ(Roots(c, &roots), status) << c.size();
    want.resize(roots.size(), Cx(-99, -99));
    EXPECT_LT(Diff(roots, want), 1e-15) << c.size();
  }
  EXPECT_EQ(PolyRootsComplex(nullptr, 0, 1000, nullptr), status::kBadSize);
  // Out of iterations; a derivative that overflows (3 c[3]) or is infinite.
  std::vector<Cx> roots, c = {1, 2, 3, 4, 5};
  EXPECT_EQ(Roots(std::vector<Cx>(31, 1.0), &roots, 1), status::kNoConvergence);
  EXPECT_EQ(Roots({1e308, 1e308, 1e308, 1e308}, &roots), status::kRootNaN);
  EXPECT_EQ(roots[0], Cx(-99, -99));
  EXPECT_EQ(Roots({1, 1, INFINITY, 1}, &roots), status::kRootNaN);
  // Roots over the coefficients: when the block after their private copy fails,
  // nothing is written.
  NumAllocFailAt(2, false);
  EXPECT_EQ(PolyRootsComplex(c.data(), 5, 1000, c.data()), status::kNoMemory);
  NumAllocFailAt(0, false);
  EXPECT_EQ(c, (std::vector<Cx>{1, 2, 3, 4, 5}));
  EXPECT_EQ(NumAllocOutstanding(), 0);
}

// Equal values compare equal; NaN matches NaN.
void ExpectSameValues(const std::vector<double>& got, const std::vector<double>& want) {
  ASSERT_EQ(got.size(), want.size());
  for (size_t i = 0; i < got.size(); ++i)
    EXPECT_TRUE(got[i] == want[i] || (std::isnan(got[i]) && std::isnan(want[i]))) << "at " << i;
}

TEST(SortAndExtremes, NaNFirstTiesAndInPlaceIntoOutAndOverItself) {
  // Any non-zero desc sorts descending.
  const std::tuple<std::vector<double>, int32_t, std::vector<double>> cases[] = {
      {{3, kNaN, 1, 2}, 0, {kNaN, 1, 2, 3}},
      {{kNaN, kNaN}, 0, {kNaN, kNaN}},
      {{kNaN}, 0, {kNaN}},
      {{1, 2, kNaN, 0, kNaN, -5}, 7, {kNaN, kNaN, 2, 1, 0, -5}},
      {{2, 2, 1, 2}, 1, {2, 2, 2, 1}},
      {{INFINITY, -INFINITY, 0, -0.0, 4}, 0, {-INFINITY, 0, 0, 4, INFINITY}},
      {{5, kNaN, -1, 5, kNaN, 0, -1, 3}, 1, {kNaN, kNaN, 5, 5, 3, 0, -1, -1}}};
  for (const auto& [in, desc, want] : cases) {
    for (int mode = 0; mode < 3; ++mode) {  // in place, into out, out == x
      std::vector<double> x = in, out(in.size(), 99.0);
      double* dest = mode == 0 ? nullptr : mode == 1 ? out.data() : x.data();
      ASSERT_EQ(SortReal(x.data(), static_cast<int32_t>(in.size()), desc, dest), 0);
      ExpectSameValues(mode == 1 ? out : x, want);
      if (mode == 1) ExpectSameValues(x, in);  // the source stays as it was
    }
  }
  double x[2] = {kNaN, 1.0}, out[2] = {5.0, 6.0};
  EXPECT_EQ(SortReal(x, 0, 0, out) + SortReal(x, -3, 1, nullptr), 2 * status::kBadSize);
  EXPECT_EQ(SortReal(x, 1, 0, out), 0);  // only the first n values are touched
  EXPECT_TRUE(std::isnan(out[0]) && out[1] == 6.0);
  // MinMaxReal skips NaN, ties keep the first index: in, then max, its index, min, its index.
  const std::pair<std::vector<double>, std::vector<double>> extremes[] = {
      {{kNaN, 2, 5, 5, -1, -1}, {5, 2, -1, 4}},
      {{kNaN, kNaN}, {kNaN, -1, kNaN, -1}},
      {{4}, {4, 0, 4, 0}},
      {{1, kNaN, 3, kNaN, 0}, {3, 2, 0, 4}},
      {{-2, -2, -2}, {-2, 0, -2, 0}},
      {{kNaN, 7, kNaN}, {7, 1, 7, 1}}};
  for (const auto& [in, want] : extremes) {
    double mx = 123.0, mn = 456.0;
    int32_t imx = 77, imn = 88;
    ASSERT_EQ(MinMaxReal(in.data(), int32_t(in.size()), &mx, &imx, &mn, &imn), 0);
    ExpectSameValues({mx, double(imx), mn, double(imn)}, want);
  }
  double v = 1.0;
  int32_t i = 3;  // untouched on refusal
  EXPECT_EQ(MinMaxReal(&v, 0, &v, &i, &v, &i), status::kBadSize);
  EXPECT_EQ(i, 3);
}

TEST(Scalars, SqrtDividePolarAndTheFinitenessScreen) {
  // op 0: sqrt(a + ib); 1: (a + ib) / (c + id); 2: |a + ib| and arg(a + ib).
  // 1e300 in a division: no overflowing squares.
  const double pi = std::numbers::pi, cases[][7] = {{0, -4, 0, 0, 0, 0, 2},
                                                    {0, 0, 0, 0, 0, 0, 0},
                                                    {0, 4, 0, 0, 0, 2, 0},
                                                    {0, 0, 2, 0, 0, 1, 1},
                                                    {0, 0, -2, 0, 0, 1, -1},
                                                    {0, -4, -0.0, 0, 0, 0, -2},
                                                    {0, 3, 4, 0, 0, 2, 1},
                                                    {0, -3, 4, 0, 0, 1, 2},
                                                    {1, 1, 0, 0, 1, 0, -1},
                                                    {1, 1, 1, 1, 1, 1, 0},
                                                    {1, 2, 4, 2, 0, 1, 2},
                                                    {1, 1, 2, 3, 4, 0.44, 0.08},
                                                    {1, 1e300, 1e300, 1e300, 1e300, 1, 0},
                                                    {2, 0, 0, 0, 0, 0, 0},
                                                    {2, -1, 0, 0, 0, 1, pi},
                                                    {2, 0, 2, 0, 0, 2, pi / 2},
                                                    {2, 3, -4, 0, 0, 5, -0.9272952180016122}};
  for (const auto& c : cases) {
    double re = 9, im = 9;
    EXPECT_EQ(c[0] == 0   ? ComplexSqrt(c[1], c[2], &re, &im)
              : c[0] == 1 ? ComplexDivide(c[1], c[2], c[3], c[4], &re, &im)
                          : ComplexToPolar(c[1], c[2], &re, &im),
              0);
    EXPECT_NEAR(std::abs(Cx(re, im) - Cx(c[5], c[6])), 0.0, 3e-15) << c[0] << " " << c[1];
  }
  // Rejected: NaN, infinities, DBL_MAX and everything at or below -1.7976931348623e308.
  for (auto [v, rejected] : {std::pair{1.0, 0},
                             {DBL_MAX, 1},
                             {std::nextafter(DBL_MAX, 0.0), 0},
                             {-DBL_MAX, 1},
                             {-1.7976931348623e308, 1},
                             {std::nextafter(-1.7976931348623e308, 0.0), 0},
                             {INFINITY, 1},
                             {-INFINITY, 1},
                             {NAN, 1},
                             {DBL_TRUE_MIN, 0}}) {
    const double pair[2] = {1.0, v};
    const Cx both[2] = {Cx(v, 0.5), Cx(0.5, v)};
    EXPECT_EQ(HasNonFiniteReal(pair, 2) + HasNonFiniteReal(pair, 1), rejected) << v;
    EXPECT_EQ(HasNonFiniteComplex(both, 1) + HasNonFiniteComplex(both + 1, 1), 2 * rejected);
  }
  // Past the first few hundred elements, and up to just before the rejected one.
  std::vector<Cx> run(300, Cx(1.0, 1.0));
  run[277] = Cx(1.0, NAN);
  const double* parts = reinterpret_cast<const double*>(run.data());
  EXPECT_EQ(HasNonFiniteReal(parts, 600) * 2 + HasNonFiniteReal(parts, 555), 2);
  EXPECT_EQ(HasNonFiniteComplex(run.data(), 300) * 2 + HasNonFiniteComplex(run.data(), 277), 2);
}

}  // namespace

// rcond = 0 leaves DGELSD its own cut at machine epsilon; a negative rcond
// cuts at epsilon times max(m, n). On diag(1, 4e-16), between the two, the
// second component of the solution is 2.5e15 or 0, for a system solved
// directly and for a tall one reduced by QR first.
TEST(LeastSquares, ZeroRcondKeepsWhatTheDefaultCuts) {
  for (const int32_t rows : {2, 3, 40}) {
    std::vector<double> A(static_cast<size_t>(rows) * 2, 0.0), b(static_cast<size_t>(rows), 0.0);
    A[0] = 1.0;
    A[3] = 4e-16;
    b[0] = 1.0;
    b[1] = 1.0;
    for (const auto& [rcond, second] : {std::pair{0.0, 2.5e15}, std::pair{-1.0, 0.0}}) {
      double x[2] = {-7.0, -7.0};
      const StatusCode st = LeastSquaresReal(A.data(), rows, 2, b.data(), 1, x, rcond);
      EXPECT_EQ(st, rcond == 0.0 ? status::kOk : status::kRankDeficient) << rows;
      EXPECT_DOUBLE_EQ(x[0], 1.0) << rows;
      EXPECT_NEAR(x[1], second, 1e-6 * std::max(second, 1.0)) << rows << " rcond " << rcond;
    }
  }
}
