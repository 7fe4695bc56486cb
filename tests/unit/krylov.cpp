// The Hankel operator by FFT and its leading singular triplets, against oracles
// that never use an FFT: products summed directly in long double, the
// singular values of the formed matrix by the dense SVD, and the identities
// H v = s u, H^H u = s v, V^H V = I checked by direct sums.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <complex>
#include <numbers>
#include <random>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/krylov.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

using Cx = std::complex<double>;
using Lcx = std::complex<long double>;
constexpr double kEps = 2.220446049250313e-16;
template <typename T>
constexpr bool kIsCx = !std::is_same_v<T, double>;

Lcx Widen(double v) { return {v, 0.0L}; }
Lcx Widen(Cx v) { return {v.real(), v.imag()}; }

// Records: white noise, damped exponentials in noise, the same without noise
// (rank exactly `modes`, where the bidiagonalization breaks down), and two
// modes 1/n apart in frequency.
enum Kind { kNoise, kModes, kNoiseFree, kClose };

template <typename T>
std::vector<T> Record(Kind kind, int64_t n, int modes, uint32_t seed) {
  std::mt19937_64 gen(seed);
  std::normal_distribution<double> g(0.0, 1.0);
  std::vector<T> x(static_cast<size_t>(n));
  const double sigma = kind == kNoise ? 1.0 : kind == kNoiseFree ? 0.0 : 0.03;
  for (int64_t t = 0; t < n; ++t) {
    Cx v(0.0, 0.0);
    for (int m = 0; kind != kNoise && m < modes; ++m) {
      const double f = kind == kClose && m == 1 ? 0.1 + 1.0 / double(n) : 0.1 + 0.37 * m / modes;
      v += (1.0 + 0.5 * m) * std::exp(Cx(-0.5 / double(n), 2.0 * std::numbers::pi * f) * double(t));
    }
    v += sigma * Cx(g(gen), g(gen));
    if constexpr (kIsCx<T>)
      x[static_cast<size_t>(t)] = v;
    else
      x[static_cast<size_t>(t)] = v.real() + v.imag();
  }
  return x;
}

// (H v)_i and (H^H u)_j summed directly.
template <typename T>
std::vector<Lcx> Direct(const std::vector<T>& x, int32_t rows, int32_t cols, const T* v,
                        int32_t stride, bool adjoint) {
  std::vector<Lcx> out(static_cast<size_t>(adjoint ? cols : rows));
  for (int32_t i = 0; i < rows; ++i)
    for (int32_t j = 0; j < cols; ++j) {
      const Lcx h = Widen(x[static_cast<size_t>(i + cols - 1 - j)]);
      if (adjoint)
        out[size_t(j)] += std::conj(h) * Widen(v[i * stride]);
      else
        out[size_t(i)] += h * Widen(v[j * stride]);
    }
  return out;
}

template <typename T>
long double Norm(const std::vector<Lcx>& v) {
  long double s = 0;
  for (const Lcx& e : v) s += std::norm(e);
  return std::sqrt(s);
}

struct Shape {
  int32_t rows, cols, count;
  Kind kind;
};
const Shape kShapes[] = {
    {1, 1, 1, kNoise},     {7, 3, 3, kNoise},      {3, 7, 2, kNoise},         {200, 100, 4, kModes},
    {100, 200, 4, kModes}, {341, 170, 8, kModes},  {300, 150, 3, kNoiseFree}, {240, 120, 2, kClose},
    {500, 60, 16, kNoise}, {1000, 499, 6, kModes},
};

template <typename T>
void CheckProducts() {
  for (const Shape& s : kShapes) {
    SCOPED_TRACE(testing::Message() << s.rows << "x" << s.cols);
    const std::vector<T> x = Record<T>(s.kind, s.rows + s.cols - 1, 3, 5);
    const int32_t k = 3;
    std::vector<T> V(size_t(s.cols) * k), U(size_t(s.rows) * k), Z(size_t(s.rows) * k),
        W(size_t(s.cols) * k);
    std::mt19937_64 gen(9);
    std::uniform_real_distribution<double> d(-1, 1);
    auto draw = [&]() -> T {
      const double re = d(gen);
      if constexpr (kIsCx<T>)
        return T(re, d(gen));
      else
        return re;
    };
    for (T& e : V) e = draw();
    for (T& e : U) e = draw();
    ASSERT_EQ(HankelProductFft(x.data(), s.rows, s.cols, V.data(), k, Z.data()), 0);
    ASSERT_EQ(HankelAdjointProductFft(x.data(), s.rows, s.cols, U.data(), k, W.data()), 0);
    for (int32_t c = 0; c < k; ++c) {
      const auto z = Direct(x, s.rows, s.cols, V.data() + c, k, false);
      const auto w = Direct(x, s.rows, s.cols, U.data() + c, k, true);
      const long double bz = Norm<T>(z), bw = Norm<T>(w);
      for (int32_t i = 0; i < s.rows; ++i)
        EXPECT_LE(std::abs(Widen(Z[size_t(i) * k + c]) - z[size_t(i)]), 64 * kEps * bz);
      for (int32_t j = 0; j < s.cols; ++j)
        EXPECT_LE(std::abs(Widen(W[size_t(j) * k + c]) - w[size_t(j)]), 64 * kEps * bw);
    }
  }
}

template <typename T>
void CheckTriplets() {
  for (const Shape& s : kShapes) {
    SCOPED_TRACE(testing::Message()
                 << s.rows << "x" << s.cols << " count " << s.count << " kind " << s.kind);
    const int modes = std::max(1, s.count / 2);
    const std::vector<T> x = Record<T>(s.kind, s.rows + s.cols - 1, modes, 17);
    std::vector<double> S(size_t(s.count));
    std::vector<T> U(size_t(s.rows) * s.count), V(size_t(s.cols) * s.count);
    ASSERT_EQ(HankelSvdLeading(x.data(), s.rows, s.cols, s.count, S.data(), U.data(), V.data()), 0);
    // The dense singular values of the formed matrix.
    std::vector<T> H(size_t(s.rows) * s.cols);
    for (int32_t i = 0; i < s.rows; ++i)
      for (int32_t j = 0; j < s.cols; ++j)
        H[size_t(i) * s.cols + j] = x[size_t(i + s.cols - 1 - j)];
    const int32_t r = std::min(s.rows, s.cols);
    std::vector<double> Sd(static_cast<size_t>(r));
    std::vector<T> Ud(size_t(s.rows) * r), Vd(size_t(s.cols) * r);
    ASSERT_EQ(Svd(H.data(), s.rows, s.cols, Ud.data(), Sd.data(), Vd.data(), 0), 0);
    const double s1 = Sd[0];
    for (int32_t i = 0; i < s.count; ++i) {
      EXPECT_NEAR(S[size_t(i)], Sd[size_t(i)], 1e-12 * s1) << "value " << i;
      // H v = s u and H^H u = s v by direct sums; unit vectors.
      const auto hv = Direct(x, s.rows, s.cols, V.data() + i, s.count, false);
      const auto hu = Direct(x, s.rows, s.cols, U.data() + i, s.count, true);
      long double r1 = 0, r2 = 0;
      for (int32_t a = 0; a < s.rows; ++a)
        r1 += std::norm(hv[size_t(a)] -
                        Widen(U[size_t(a) * s.count + i]) * (long double)S[size_t(i)]);
      for (int32_t b = 0; b < s.cols; ++b)
        r2 += std::norm(hu[size_t(b)] -
                        Widen(V[size_t(b) * s.count + i]) * (long double)S[size_t(i)]);
      EXPECT_LE(std::sqrt(r1), 1e-12 * s1) << "H v - s u, triplet " << i;
      EXPECT_LE(std::sqrt(r2), 1e-12 * s1) << "H^H u - s v, triplet " << i;
      for (int32_t j = 0; j <= i; ++j) {
        Lcx dot = 0;
        for (int32_t b = 0; b < s.cols; ++b)
          dot += std::conj(Widen(V[size_t(b) * s.count + j])) * Widen(V[size_t(b) * s.count + i]);
        EXPECT_NEAR(double(std::abs(dot - Lcx(i == j ? 1 : 0))), 0.0, 1e-12) << i << "," << j;
      }
    }
  }
}

TEST(HankelFft, ProductsMatchDirectSums) {
  CheckProducts<double>();
  CheckProducts<Cx>();
}

TEST(HankelFft, LeadingTripletsMatchDenseSvd) {
  CheckTriplets<double>();
  CheckTriplets<Cx>();
}

TEST(HankelFft, RefusesBadSizesAndCountsAllocations) {
  std::vector<double> x(64, 1.0), S(4), V(32 * 4);
  EXPECT_EQ(HankelSvdLeading<double>(x.data(), 33, 32, 0, S.data(), nullptr, V.data()), -20003);
  EXPECT_EQ(HankelSvdLeading<double>(x.data(), 33, 32, 33, S.data(), nullptr, V.data()), -20003);
  EXPECT_EQ(HankelSvdLeading<double>(x.data(), 0, 32, 1, S.data(), nullptr, V.data()), -20003);
  // Every allocation failed in turn: the failure is returned and nothing leaks.
  const std::vector<double> rec = Record<double>(kModes, 64, 2, 3);
  for (int64_t fail = 1;; ++fail) {
    NumAllocFailAt(fail, false);
    const StatusCode st =
        HankelSvdLeading<double>(rec.data(), 33, 32, 4, S.data(), nullptr, V.data());
    const bool reached = NumAllocAttempts() >= fail;
    NumAllocFailAt(0, false);
    EXPECT_EQ(NumAllocOutstanding(), 0);
    if (!reached) {
      EXPECT_EQ(st, 0);
      break;
    }
    EXPECT_EQ(st, -20001) << "allocation " << fail;
  }
}

}  // namespace

// ---- the matrix pencil on the Krylov route against the dense route ------------------------
namespace pencil {

struct Case {
  int32_t n, M;
  Kind kind;
  double snr_db;
};

template <typename T>
void Agree() {
  const Case cases[] = {{256, 2, kModes, 40},     {256, 4, kModes, 10},  {1024, 8, kModes, 30},
                        {1024, 3, kNoiseFree, 0}, {1200, 2, kClose, 40}, {1536, 6, kModes, 20},
                        {999, 5, kModes, 25}};
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << "n " << c.n << " M " << c.M << " kind " << c.kind);
    const int modes = c.kind == kClose ? 2 : c.M;
    std::vector<T> x = Record<T>(c.kind == kModes ? kNoiseFree : c.kind, c.n, modes, 23);
    if (c.kind == kModes) {  // noise at the asked SNR against the first mode
      std::mt19937_64 gen(29);
      std::normal_distribution<double> g(0.0, std::pow(10.0, -c.snr_db / 20.0));
      for (T& v : x) {
        if constexpr (kIsCx<T>)
          v += T(g(gen), g(gen));
        else
          v += g(gen);
      }
    }
    const int32_t L = c.n / 3;
    std::vector<double> a[2], p[2], d[2], f[2], mse(2);
    std::vector<int32_t> count(2);
    StatusCode st[2];
    for (int route = 0; route < 2; ++route) {
      for (auto* v : {&a[route], &p[route], &d[route], &f[route]}) v->assign(size_t(c.M), 0.0);
      if constexpr (kIsCx<T>) {
        st[route] = MatrixPencilSolverComplex(x.data(), c.n, L, c.M, 1.0,
                                              route ? PencilSolver::kKrylov : PencilSolver::kDense,
                                              a[route].data(), p[route].data(), d[route].data(),
                                              f[route].data(), &count[route], &mse[route]);
      } else {
        st[route] = MatrixPencilSolverReal(x.data(), c.n, L, c.M, 1.0, 0,
                                           route ? PencilSolver::kKrylov : PencilSolver::kDense,
                                           a[route].data(), p[route].data(), d[route].data(),
                                           f[route].data(), &count[route], &mse[route]);
      }
    }
    ASSERT_EQ(st[0], st[1]);
    ASSERT_EQ(st[0], 0);
    ASSERT_EQ(count[0], count[1]);
    // Modes in frequency order on both routes.
    std::vector<int> o[2];
    for (int route = 0; route < 2; ++route) {
      for (int i = 0; i < count[route]; ++i) o[route].push_back(i);
      std::sort(o[route].begin(), o[route].end(),
                [&](int i, int j) { return f[route][size_t(i)] < f[route][size_t(j)]; });
    }
    for (int k = 0; k < count[0]; ++k) {
      const size_t i = size_t(o[0][size_t(k)]), j = size_t(o[1][size_t(k)]);
      EXPECT_NEAR(f[1][j], f[0][i], 1e-9 * std::max(1e-3, std::abs(f[0][i]))) << "frequency " << k;
      EXPECT_NEAR(d[1][j], d[0][i], 1e-9 * std::max(1e-3, std::abs(d[0][i]))) << "damping " << k;
      EXPECT_NEAR(a[1][j], a[0][i], 1e-8 * a[0][i]) << "amplitude " << k;
      EXPECT_NEAR(p[1][j], p[0][i], 1e-8) << "phase " << k;
    }
    EXPECT_NEAR(mse[1], mse[0], 1e-8 * mse[0] + 1e-20);  // noise-free: rounding level
  }
}

}  // namespace pencil

TEST(HankelFft, PencilKrylovRouteAgreesWithDense) {
  pencil::Agree<double>();
  pencil::Agree<Cx>();
}

// ---- the forward-backward prediction matrix ---------------------------------------------
// [F; Bk] of x for order p: F[i][j] = x[i+p-1-j], Bk[i][j] = conj(x[i+1+j]),
// formed entry by entry from those definitions.
namespace fb {

template <typename T>
T Conj(T v) {
  if constexpr (kIsCx<T>)
    return std::conj(v);
  else
    return v;
}

template <typename T>
std::vector<T> Formed(const std::vector<T>& x, int32_t p) {
  const int32_t q = int32_t(x.size()) - p;
  std::vector<T> A(size_t(2 * q) * p);
  for (int32_t i = 0; i < q; ++i)
    for (int32_t j = 0; j < p; ++j) {
      A[size_t(i) * p + j] = x[size_t(i + p - 1 - j)];
      A[size_t(q + i) * p + j] = Conj(x[size_t(i + 1 + j)]);
    }
  return A;
}

template <typename T>
StatusCode Leading(const std::vector<T>& x, int32_t p, int32_t count, double* S, T* U, T* V) {
  return ForwardBackwardSvdLeading(x.data(), int32_t(x.size()), p, count, S, U, V);
}

struct Shape {
  int32_t n, p;
  Kind kind;
  int32_t count;  // 0: every count from 1 to min(2q, p)
};
const Shape kShapes[] = {
    {2, 1, kNoise, 0},      {10, 3, kNoise, 0},      // q > p
    {10, 6, kNoise, 0},     {20, 14, kNoise, 0},     // q < p: 2q > p, then 2q < p (wide)
    {24, 16, kModes, 0},    {24, 9, kNoiseFree, 0},  // 2q = p; a rank-6 record
    {300, 100, kModes, 8},  {300, 200, kModes, 8},  {301, 200, kNoiseFree, 5},
    {600, 400, kModes, 16}, {240, 80, kClose, 3},   {500, 60, kNoise, 17},
};

template <typename T>
void Check() {
  for (const Shape& s : kShapes) {
    const int32_t q = s.n - s.p, rows = 2 * q, r = std::min(rows, s.p);
    const std::vector<T> x = Record<T>(s.kind, s.n, 3, 41);
    const std::vector<T> A = Formed(x, s.p);
    std::vector<double> Sd(size_t(r), 0.0);
    std::vector<T> Ud(size_t(rows) * r), Vd(size_t(s.p) * r);
    StatusCode st;
    if constexpr (kIsCx<T>)
      st = SvdComplex(A.data(), rows, s.p, Ud.data(), Sd.data(), Vd.data(), 0);
    else
      st = SvdReal(A.data(), rows, s.p, Ud.data(), Sd.data(), Vd.data(), 0);
    ASSERT_EQ(st, 0);
    const double s1 = Sd[0];
    for (int32_t count = s.count ? s.count : 1; count <= (s.count ? s.count : r); ++count) {
      SCOPED_TRACE(testing::Message()
                   << "n " << s.n << " p " << s.p << " count " << count << " kind " << s.kind);
      std::vector<double> S(static_cast<size_t>(count));
      std::vector<T> U(size_t(rows) * count), V(size_t(s.p) * count);
      ASSERT_EQ(Leading(x, s.p, count, S.data(), U.data(), V.data()), 0);
      for (int32_t i = 0; i < count; ++i) {
        EXPECT_NEAR(S[size_t(i)], Sd[size_t(i)], 1e-12 * s1) << "value " << i;
        // A v = s u and A^H u = s v over the formed A, in long double.
        long double r1 = 0, r2 = 0;
        for (int32_t a = 0; a < rows; ++a) {
          Lcx sum = 0;
          for (int32_t b = 0; b < s.p; ++b)
            sum += Widen(A[size_t(a) * s.p + b]) * Widen(V[size_t(b) * count + i]);
          r1 += std::norm(sum - Widen(U[size_t(a) * count + i]) * (long double)S[size_t(i)]);
        }
        for (int32_t b = 0; b < s.p; ++b) {
          Lcx sum = 0;
          for (int32_t a = 0; a < rows; ++a)
            sum += std::conj(Widen(A[size_t(a) * s.p + b])) * Widen(U[size_t(a) * count + i]);
          r2 += std::norm(sum - Widen(V[size_t(b) * count + i]) * (long double)S[size_t(i)]);
        }
        EXPECT_LE(std::sqrt(r1), 1e-12 * s1) << "A v - s u, triplet " << i;
        EXPECT_LE(std::sqrt(r2), 1e-12 * s1) << "A^H u - s v, triplet " << i;
        for (int32_t j = 0; j <= i; ++j) {
          Lcx du = 0, dv = 0;
          for (int32_t b = 0; b < s.p; ++b)
            dv += std::conj(Widen(V[size_t(b) * count + j])) * Widen(V[size_t(b) * count + i]);
          for (int32_t a = 0; a < rows; ++a)
            du += std::conj(Widen(U[size_t(a) * count + j])) * Widen(U[size_t(a) * count + i]);
          const Lcx e(i == j ? 1 : 0);
          EXPECT_NEAR(double(std::abs(dv - e)), 0.0, 1e-12) << "V " << i << "," << j;
          // A zero singular value leaves its left vector free: only the
          // others must be orthonormal.
          if (S[size_t(j)] > 1e-12 * s1 && S[size_t(i)] > 1e-12 * s1) {
            EXPECT_NEAR(double(std::abs(du - e)), 0.0, 1e-12) << "U " << i << "," << j;
          }
        }
      }
    }
  }
}

}  // namespace fb

TEST(ForwardBackwardFft, LeadingTripletsMatchDenseSvdOfTheFormedMatrix) {
  fb::Check<double>();
  fb::Check<Cx>();
}

TEST(ForwardBackwardFft, RefusesBadSizesAndCountsAllocations) {
  std::vector<Cx> x(60, Cx(1.0, 0.5)), U(120 * 8), V(40 * 8);
  std::vector<double> S(8);
  // Order 0, order n, count 0, count above min(2q, p) (p = 40, 2q = 40).
  for (const auto& [n, p, count] : {std::array<int32_t, 3>{60, 0, 1},
                                    {60, 60, 1},
                                    {60, 20, 0},
                                    {60, 40, 41},
                                    {60, 50, 21},
                                    {0, 0, 1}}) {
    EXPECT_EQ(ForwardBackwardSvdLeading(x.data(), n, p, count, S.data(), U.data(), V.data()),
              -20003)
        << n << " " << p << " " << count;
  }
  const std::vector<Cx> rec = Record<Cx>(kModes, 60, 2, 3);
  for (int64_t fail = 1;; ++fail) {
    NumAllocFailAt(fail, false);
    const StatusCode st =
        ForwardBackwardSvdLeading(rec.data(), 60, 20, 5, S.data(), U.data(), V.data());
    const bool reached = NumAllocAttempts() >= fail;
    NumAllocFailAt(0, false);
    EXPECT_EQ(NumAllocOutstanding(), 0);
    if (!reached) {
      EXPECT_EQ(st, 0);
      break;
    }
    EXPECT_EQ(st, -20001) << "allocation " << fail;
  }
}

// ---- principal-component AR on the Krylov route against the dense route ------------------
namespace pcar {

template <typename T>
StatusCode Fit(const std::vector<T>& x, int32_t n, int32_t p, int32_t k, PcarSolver solver,
               std::vector<T>& a, std::vector<Cx>& roots) {
  a.assign(size_t(std::max(p, 0)) + 1, T(-7.0));
  roots.assign(size_t(std::max(p, 1)), Cx(-7.0, 0.0));
  if constexpr (kIsCx<T>)
    return PcarSolverComplex(x.data(), n, p, k, solver, a.data(), roots.data());
  else
    return PcarSolverReal(x.data(), n, p, k, solver, a.data(), roots.data());
}

// Records of `modes` damped exponentials (their real parts for real data) at
// an SNR against the first one; snr_db 0: noise-free.
template <typename T>
std::vector<T> Modes(int32_t n, int modes, double snr_db, uint32_t seed) {
  std::mt19937_64 gen(seed);
  std::normal_distribution<double> g(0.0, snr_db > 0 ? std::pow(10.0, -snr_db / 20.0) : 0.0);
  std::vector<T> x(static_cast<size_t>(n));
  for (int32_t t = 0; t < n; ++t) {
    Cx v(0.0, 0.0);
    for (int m = 0; m < modes; ++m)
      v += (1.0 + 0.3 * m) *
           std::exp(Cx(-0.4 / n, 2.0 * std::numbers::pi * (0.04 + 0.43 * m / modes)) * double(t));
    if (snr_db > 0) v += Cx(g(gen), g(gen));
    if constexpr (kIsCx<T>)
      x[size_t(t)] = v;
    else
      x[size_t(t)] = v.real();
  }
  return x;
}

struct Case {
  int32_t n, modes;
  double snr_db;  // 0: noise-free
  int32_t k[4];   // component counts tried (0: none)
};

// Noise-free records keep k at or below their rank (modes, or 2 modes for
// real data): beyond it the kept components are rounding noise on either
// route. Noisy ones go past it into the noise.
template <typename T>
void Agree() {
  const int rank = kIsCx<T> ? 1 : 2;
  const Case cases[] = {
      {150, 4, 0, {1, 2, 4, 0}},    {300, 8, 40, {1, 4, 8, 16}}, {301, 3, 10, {1, 3, 6, 12}},
      {900, 6, 20, {2, 6, 12, 16}}, {1200, 8, 0, {1, 8, 0, 0}},  {2700, 5, 30, {5, 16, 0, 0}},
  };
  for (const Case& c : cases) {
    const std::vector<T> x = Modes<T>(c.n, c.modes, c.snr_db, 11);
    for (const int32_t p : {c.n / 3, 2 * c.n / 3}) {
      if (c.n > 2000 && p > c.n / 3) continue;  // the dense route alone takes seconds there
      for (const int32_t k : c.k) {
        if (k == 0 || (c.snr_db == 0 && k > rank * c.modes)) continue;
        SCOPED_TRACE(testing::Message()
                     << "n " << c.n << " p " << p << " k " << k << " snr " << c.snr_db);
        std::vector<T> a[2];
        std::vector<Cx> z[2];
        const StatusCode dense = Fit(x, c.n, p, k, PcarSolver::kDense, a[0], z[0]);
        const StatusCode krylov = Fit(x, c.n, p, k, PcarSolver::kKrylov, a[1], z[1]);
        ASSERT_EQ(dense, 0);
        ASSERT_EQ(krylov, dense);
        long double num = 0, den = 0;
        for (size_t j = 0; j < a[0].size(); ++j) {
          num += std::norm(Widen(a[1][j]) - Widen(a[0][j]));
          den += std::norm(Widen(a[0][j]));
        }
        EXPECT_LE(double(std::sqrt(num / den)), 1e-9) << "coefficients";
        // The same roots: each Krylov root within 1e-9 (relative to its size, 1
        // at least) of a distinct dense one, the nearest unclaimed.
        std::vector<bool> used(z[0].size(), false);
        double worst = 0.0;
        for (const Cx& r : z[1]) {
          size_t best = 0;
          double d = INFINITY;
          for (size_t i = 0; i < z[0].size(); ++i)
            if (!used[i] && std::abs(z[0][i] - r) < d) d = std::abs(z[0][i] - r), best = i;
          used[best] = true;
          worst = std::max(worst, d / std::max(1.0, std::abs(r)));
        }
        EXPECT_LE(worst, 1e-9) << "roots";
      }
    }
  }
}

}  // namespace pcar

TEST(PcarKrylov, SameCoefficientsRootsAndStatusesAsTheDenseRoute) {
  pcar::Agree<double>();
  pcar::Agree<Cx>();
}

// Argument refusals, a non-finite record and an all-zero one: the dense
// route's statuses and numbers.
TEST(PcarKrylov, SameStatusesAtTheEdges) {
  struct Edge {
    int32_t n, p, k;
    double fill;  // every sample; NaN and infinity included
  };
  // Arguments the checks refuse never reach a route: the faces' tests cover them.
  const Edge edges[] = {{9, 6, 6, 0.0},        {40, 13, 3, 0.0}, {40, 13, 3, NAN},
                        {40, 13, 3, INFINITY}, {3, 2, 1, 0.0},   {3, 2, 2, 0.0}};
  for (const Edge& e : edges) {
    SCOPED_TRACE(testing::Message()
                 << "n " << e.n << " p " << e.p << " k " << e.k << " fill " << e.fill);
    std::vector<Cx> x(size_t(std::max(e.n, 1)), Cx(e.fill, 0.0)), a[2];
    std::vector<Cx> z[2];
    const StatusCode dense = pcar::Fit(x, e.n, e.p, e.k, PcarSolver::kDense, a[0], z[0]);
    const StatusCode krylov = pcar::Fit(x, e.n, e.p, e.k, PcarSolver::kKrylov, a[1], z[1]);
    EXPECT_EQ(krylov, dense);
    if (dense == 0) {
      EXPECT_EQ(a[1], a[0]);
      EXPECT_EQ(z[1], z[0]);
    }
  }
  // The automatic choice keeps the dense route, bit for bit, on short records.
  const std::vector<double> x = pcar::Modes<double>(120, 3, 20, 5);
  std::vector<double> a[2];
  std::vector<Cx> z[2];
  ASSERT_EQ(pcar::Fit(x, 120, 40, 4, PcarSolver::kAuto, a[0], z[0]), 0);
  a[1].resize(a[0].size());
  z[1].resize(z[0].size());
  ASSERT_EQ(PcarEstimateReal(x.data(), 120, 40, 4, a[1].data(), z[1].data()), 0);
  EXPECT_EQ(a[0], a[1]);
}

TEST(PcarKrylov, EveryAllocationFailureIsReported) {
  const std::vector<Cx> x = pcar::Modes<Cx>(200, 3, 20, 7);
  std::vector<Cx> a, z, clean_a, clean_z;
  ASSERT_EQ(pcar::Fit(x, 200, 66, 3, PcarSolver::kKrylov, clean_a, clean_z), 0);
  for (int64_t fail = 1;; ++fail) {
    NumAllocFailAt(fail, false);
    const StatusCode st = pcar::Fit(x, 200, 66, 3, PcarSolver::kKrylov, a, z);
    const bool reached = NumAllocAttempts() >= fail;
    NumAllocFailAt(0, false);
    EXPECT_EQ(NumAllocOutstanding(), 0);
    if (!reached) {
      EXPECT_EQ(st, 0);
      EXPECT_EQ(a, clean_a);
      break;
    }
    EXPECT_EQ(st, -20001) << "allocation " << fail;
  }
}
