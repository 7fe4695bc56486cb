// The Krylov routes of the matrix pencil and of principal-component AR through
// the plain face: the same statuses as the dense route at the edges of their
// arguments, the face's promise (finite results or an error with zeroed
// outputs) on degenerate records, and every allocation or LAPACK failure
// inside them reported, with zeroed outputs and nothing left allocated.

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstring>
#include <string>
#include <vector>

#include "numeric/lapack_boundary.h"
#include "numeric/work.h"
#include "qdm_api.h"
#include "support/fault_sweep.h"

namespace {

// One pencil call on either data type: the four mode arrays, the count, mse.
struct Fit {
  int32_t status = 0;
  std::vector<double> out[4];
  int32_t count = -7;
  double mse = -7.0;
};

Fit Pencil(const std::vector<double>& x, bool complex, int32_t L, int32_t M, int32_t solver) {
  Fit f;
  for (auto& o : f.out) o.assign(static_cast<size_t>(M), -7.0);
  const int32_t n = static_cast<int32_t>(complex ? x.size() / 2 : x.size());
  f.status =
      complex
          ? qdm_matrix_pencil_solver_complex(reinterpret_cast<const qdm_complex*>(x.data()), n, L,
                                             M, 1.0, solver, f.out[0].data(), f.out[1].data(),
                                             f.out[2].data(), f.out[3].data(), &f.count, &f.mse)
          : qdm_matrix_pencil_solver_real(x.data(), n, L, M, 1.0, 0, solver, f.out[0].data(),
                                          f.out[1].data(), f.out[2].data(), f.out[3].data(),
                                          &f.count, &f.mse);
  return f;
}

bool Zeroed(const Fit& f) {
  for (const auto& o : f.out)
    for (double v : o)
      if (v != 0.0) return false;
  return f.count == 0 && f.mse == 0.0;
}

bool Same(const Fit& a, const Fit& b) {
  for (int i = 0; i < 4; ++i)
    if (std::memcmp(a.out[i].data(), b.out[i].data(), a.out[i].size() * sizeof(double)) != 0)
      return false;
  return a.status == b.status && a.count == b.count && a.mse == b.mse;
}

// Records of n samples (interleaved re, im when complex).
enum Kind { kModes, kZeros, kConstant, kSpike, kRamp, kAlternating };

std::vector<double> Record(Kind kind, int32_t n, bool complex) {
  std::vector<double> x(static_cast<size_t>(n) * (complex ? 2 : 1));
  for (int32_t t = 0; t < n; ++t) {
    std::complex<double> v;
    switch (kind) {
      case kModes:
        v = std::exp(std::complex<double>(-0.002, 0.7) * double(t)) +
            0.5 * std::exp(std::complex<double>(-0.004, 1.9) * double(t)) +
            1e-3 * std::complex<double>(std::sin(7.3 * t * t), std::cos(3.1 * t * t));
        break;
      case kZeros:
        break;
      case kConstant:
        v = 1.5;
        break;
      case kSpike:
        v = t == n / 2 ? 1.0 : 0.0;
        break;
      case kRamp:
        v = 0.01 * t;
        break;
      case kAlternating:
        v = t % 2 ? -1.0 : 1.0;
        break;
    }
    if (complex) {
      x[2 * size_t(t)] = v.real();
      x[2 * size_t(t) + 1] = v.imag();
    } else {
      x[size_t(t)] = v.real() + v.imag();
    }
  }
  return x;
}

TEST(PlainKrylov, SameStatusesAsTheDenseRoute) {
  struct Row {
    Kind kind;
    int32_t n, L, M;
  };
  const Row rows[] = {
      {kModes, 300, 100, 4},   {kModes, 300, 190, 4},  // L > n/2: the wide orientation
      {kModes, 300, 199, 120},                         // M above r = n - L: fewer modes
      {kModes, 12, 4, 4},      {kModes, 3, 2, 1},      // the subspace is the whole space
      {kZeros, 200, 66, 3},    {kConstant, 200, 66, 3},    {kSpike, 200, 66, 3},
      {kRamp, 200, 66, 3},     {kAlternating, 200, 66, 3},
  };
  for (const bool complex : {false, true}) {
    for (const Row& r : rows) {
      const std::string where = std::string(complex ? "complex" : "real") + " kind " +
                                std::to_string(r.kind) + " n " + std::to_string(r.n) + " L " +
                                std::to_string(r.L) + " M " + std::to_string(r.M);
      const std::vector<double> x = Record(r.kind, r.n, complex);
      const Fit dense = Pencil(x, complex, r.L, r.M, QDM_SOLVER_DENSE);
      const Fit krylov = Pencil(x, complex, r.L, r.M, QDM_SOLVER_KRYLOV);
      if (r.kind == kModes) {
        EXPECT_EQ(krylov.status, dense.status) << where;
        EXPECT_EQ(krylov.count, dense.count) << where;
      }
      // Degenerate records have tied or zero singular values, so which M
      // triplets a route takes is arbitrary and the statuses may differ; each
      // must still be a clean result or a clean error.
      if (krylov.status < 0) {
        EXPECT_TRUE(Zeroed(krylov)) << where;
      } else {
        EXPECT_TRUE(krylov.count >= 0 && krylov.count <= r.M && std::isfinite(krylov.mse)) << where;
        for (const auto& o : krylov.out)
          for (int32_t i = 0; i < krylov.count; ++i)
            EXPECT_TRUE(std::isfinite(o[size_t(i)])) << where;
      }
    }
  }
}

// Each allocation failed in turn (once, from then on) and each LAPACK driver
// call made to report INFO 1 or -1: a call fails exactly when its fault was
// reached, with its outputs zeroed, and otherwise gives the clean result.
TEST(PlainKrylov, EveryFaultIsReported) {
  int64_t faulted = 0;
  FaultSweep(
      [](bool complex) {
        return Pencil(Record(kModes, 240, complex), complex, 80, 4, QDM_SOLVER_KRYLOV);
      },
      [](const Fit& f, const Fit& clean, const std::string& where) {
        EXPECT_TRUE(Same(f, clean)) << where;
      },
      [](const Fit& f, bool) { return Zeroed(f); }, &faulted);
  std::printf("Krylov route: %lld faulted calls, none reported as success\n",
              static_cast<long long>(faulted));
}

// ---- principal-component AR ------------------------------------------------------------

// One PCAR call on either data type: the coefficients (interleaved when
// complex) and the roots (interleaved).
struct Ar {
  int32_t status = 0;
  std::vector<double> a, z;
};

Ar Pcar(const std::vector<double>& x, bool complex, int32_t p, int32_t k, int32_t solver) {
  Ar f;
  const size_t room = static_cast<size_t>(std::max(p, 1));
  f.a.assign((room + 1) * (complex ? 2 : 1), -7.0);
  f.z.assign(room * 2, -7.0);
  const int32_t n = static_cast<int32_t>(complex ? x.size() / 2 : x.size());
  auto* z = reinterpret_cast<qdm_complex*>(f.z.data());
  f.status = complex
                 ? qdm_pcar_solver_complex(reinterpret_cast<const qdm_complex*>(x.data()), n, p, k,
                                           solver, reinterpret_cast<qdm_complex*>(f.a.data()), z)
                 : qdm_pcar_solver_real(x.data(), n, p, k, solver, f.a.data(), z);
  return f;
}

bool Zeroed(const Ar& f, int32_t p, bool complex) {
  for (size_t i = 0; i < size_t(p + 1) * (complex ? 2 : 1); ++i)
    if (f.a[i] != 0.0) return false;
  for (size_t i = 0; i < size_t(p) * 2; ++i)
    if (f.z[i] != 0.0) return false;
  return true;
}

TEST(PlainKrylov, PcarSameStatusesAsTheDenseRoute) {
  struct Row {
    Kind kind;
    int32_t n, p, k;
  };
  const Row rows[] = {
      {kModes, 300, 100, 4},   {kModes, 300, 200, 4},    // p = 2n/3: 2q = p
      {kModes, 300, 200, 200}, {kModes, 12, 8, 8},       // k = p: every component
      {kModes, 3, 2, 1},       {kModes, 3, 2, 2},        // the smallest record
      {kModes, 300, 201, 4},   {kModes, 300, -1, 4},     // order out of range
      {kModes, 300, 100, 0},   {kModes, 300, 100, 101},  // count out of range
      {kModes, 0, 0, 1},                                 // no samples
      {kZeros, 200, 66, 3},    {kConstant, 200, 66, 3},    {kSpike, 200, 66, 3},
      {kRamp, 200, 66, 3},     {kAlternating, 200, 66, 3},
  };
  for (const bool complex : {false, true}) {
    for (const Row& r : rows) {
      const std::string where = std::string(complex ? "complex" : "real") + " kind " +
                                std::to_string(r.kind) + " n " + std::to_string(r.n) + " p " +
                                std::to_string(r.p) + " k " + std::to_string(r.k);
      const std::vector<double> x = Record(r.kind, std::max(r.n, 1), complex);
      const Ar dense = Pcar(x, complex, r.p, r.k, QDM_SOLVER_DENSE);
      const Ar krylov = Pcar(x, complex, r.p, r.k, QDM_SOLVER_KRYLOV);
      // Degenerate records have tied or zero singular values, where which
      // components pass the threshold is a matter of rounding on either
      // route: there, a clean result or a clean error.
      if (r.kind == kModes || r.kind == kZeros) {
        EXPECT_EQ(krylov.status, dense.status) << where;
      }
      // Refused arguments leave the outputs alone; a failed fit zeroes them.
      const bool valid = r.n >= 1 && r.p >= 0 && r.p <= 2 * r.n / 3 && r.k >= 1 && r.k <= r.p;
      const int32_t p = std::max(r.p, 0);
      if (!valid) {
        EXPECT_LT(krylov.status, 0) << where;
        EXPECT_TRUE(krylov.a == dense.a && krylov.z == dense.z && krylov.a[0] == -7.0) << where;
      } else if (krylov.status < 0) {
        EXPECT_TRUE(Zeroed(krylov, p, complex)) << where;
      } else {
        for (size_t i = 0; i < size_t(p + 1) * (complex ? 2 : 1); ++i)
          EXPECT_TRUE(std::isfinite(krylov.a[i])) << where;
      }
    }
    const std::vector<double> x = Record(kModes, 60, complex);
    for (const int32_t solver : {-1, 3}) {
      EXPECT_EQ(Pcar(x, complex, 20, 2, solver).status, QDM_ERR_SOLVER);
      // The argument checks come first.
      EXPECT_EQ(Pcar(x, complex, 20, 0, solver).status, QDM_ERR_COUNT);
    }
  }
}

// As for the pencil: each allocation failed in turn and each LAPACK driver
// call made to report INFO 1 or -1.
TEST(PlainKrylov, PcarEveryFaultIsReported) {
  int64_t faulted = 0;
  FaultSweep(
      [](bool complex) {
        return Pcar(Record(kModes, 240, complex), complex, 80, 4, QDM_SOLVER_KRYLOV);
      },
      [](const Ar& f, const Ar& clean, const std::string& where) {
        EXPECT_EQ(f.status, clean.status) << where;
        EXPECT_EQ(f.a, clean.a) << where;
        EXPECT_EQ(f.z, clean.z) << where;
      },
      [](const Ar& f, bool complex) { return Zeroed(f, 80, complex); }, &faulted);
  std::printf("PCAR's Krylov route: %lld faulted calls, none reported as success\n",
              static_cast<long long>(faulted));
}

}  // namespace
