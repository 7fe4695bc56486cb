// Products, vector helpers, the finiteness screen and transposes, against plain
// loop oracles. cblas_dgemm/cblas_zgemm are interposed in this executable to count
// the calls the row blocking makes; the counters forward to the real BLAS.

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <bit>
#include <cfloat>
#include <cmath>
#include <cstring>
#include <limits>
#include <vector>

#include "numeric/lapack_api.h"
#include "numeric/mat_mul.h"
#include "numeric/numeric.h"
#include "numeric/work.h"
#include "support/alloc_faults.h"
#include "support/dense_oracles.h"

using qdm_test::Cx;

// Netlib's cblas.h names its integer CBLAS_INT, OpenBLAS's blasint.
#ifndef CBLAS_INT
#define CBLAS_INT blasint
#endif

namespace {
int g_dgemm_calls = 0;
int g_zgemm_calls = 0;
std::vector<int> g_dgemm_rows;
}  // namespace

extern "C" void cblas_dgemm(CBLAS_LAYOUT layout, CBLAS_TRANSPOSE ta, CBLAS_TRANSPOSE tb,
                            const CBLAS_INT M, const CBLAS_INT N, const CBLAS_INT K,
                            const double alpha, const double* A, const CBLAS_INT lda,
                            const double* B, const CBLAS_INT ldb, const double beta, double* C,
                            const CBLAS_INT ldc) {
  using Fn = decltype(&cblas_dgemm);
  static Fn next = reinterpret_cast<Fn>(dlsym(RTLD_NEXT, "cblas_dgemm"));
  ++g_dgemm_calls;
  g_dgemm_rows.push_back(M);
  next(layout, ta, tb, M, N, K, alpha, A, lda, B, ldb, beta, C, ldc);
}

extern "C" void cblas_zgemm(CBLAS_LAYOUT layout, CBLAS_TRANSPOSE ta, CBLAS_TRANSPOSE tb,
                            const CBLAS_INT M, const CBLAS_INT N, const CBLAS_INT K,
                            const void* alpha, const void* A, const CBLAS_INT lda,
                            const void* B, const CBLAS_INT ldb, const void* beta, void* C,
                            const CBLAS_INT ldc) {
  using Fn = decltype(&cblas_zgemm);
  static Fn next = reinterpret_cast<Fn>(dlsym(RTLD_NEXT, "cblas_zgemm"));
  ++g_zgemm_calls;
  next(layout, ta, tb, M, N, K, alpha, A, lda, B, ldb, beta, C, ldc);
}

namespace {

template <typename T>
StatusCode MatMulNamed(const T* A, const T* B, int32_t m, int32_t k, int32_t n, T* C) {
  if constexpr (qdm_test::kIsCx<T>) {
    return MatMulComplex(A, B, m, k, n, C);
  } else {
    return MatMulReal(A, B, m, k, n, C);
  }
}

// Largest entry-wise error scaled by k * eps (entries of A and B lie in [-1, 1]).
template <typename T>
double ScaledError(const std::vector<T>& got, const std::vector<T>& want, int32_t k) {
  double worst = 0.0;
  for (size_t i = 0; i < got.size(); ++i) worst = std::max(worst, std::abs(got[i] - want[i]));
  return worst / (std::max(k, 1) * qdm_test::kEps);
}

struct Dims {
  int32_t m, k, n;
};

template <typename T>
class ProductsTyped : public ::testing::Test {};
using Scalars = ::testing::Types<double, Cx>;
TYPED_TEST_SUITE(ProductsTyped, Scalars);

TYPED_TEST(ProductsTyped, MatchesTripleLoop) {
  using T = TypeParam;
  const Dims dims[] = {{1, 1, 1}, {3, 4, 5}, {5, 1, 7}, {7, 9, 1}, {16, 16, 16}, {33, 17, 65}};
  for (const Dims& d : dims) {
    SCOPED_TRACE(::testing::Message() << d.m << "x" << d.k << "x" << d.n);
    const auto a = qdm_test::RandomMatrix<T>(d.m, d.k, 1);
    const auto b = qdm_test::RandomMatrix<T>(d.k, d.n, 2);
    // C starts as NaN garbage: the product must not depend on its old contents.
    std::vector<T> c(static_cast<size_t>(d.m * d.n), T(std::nan("")));
    ASSERT_EQ(MatMulNamed(a.data(), b.data(), d.m, d.k, d.n, c.data()), 0);
    EXPECT_LT(ScaledError(c, qdm_test::NaiveProduct(a.data(), b.data(), d.m, d.k, d.n), d.k),
              4.0);
  }
}

TYPED_TEST(ProductsTyped, EmptyInnerDimensionFillsNaN) {
  using T = TypeParam;
  std::vector<T> c(6, T(7.0));
  const T dummy{};
  ASSERT_EQ(MatMulNamed(&dummy, &dummy, 2, 0, 3, c.data()), 0);
  for (const T& v : c) {
    EXPECT_TRUE(std::isnan(std::real(v)));
    if constexpr (qdm_test::kIsCx<T>) {
      EXPECT_TRUE(std::isnan(std::imag(v)));
    }
  }
}

TYPED_TEST(ProductsTyped, EmptyResultOrNegativeDimension) {
  using T = TypeParam;
  const T one(1.0);
  struct Case {
    Dims d;
    StatusCode want;
  } cases[] = {{{0, 3, 2}, 0},          {{2, 3, 0}, 0},          {{0, 0, 0}, 0},
               {{2, 3, -1}, -20004},    {{-1, 3, 2}, -20004},    {{2, -1, 2}, -20004},
               {{-1, 0, 0}, -20004},    {{0, -2, 0}, -20004}};
  for (const Case& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.d.m << "x" << c.d.k << "x" << c.d.n);
    T out = T(42.0);
    EXPECT_EQ(MatMulNamed(&one, &one, c.d.m, c.d.k, c.d.n, &out), c.want);
    EXPECT_EQ(out, T(42.0));
  }
}

TYPED_TEST(ProductsTyped, CopyingWorkerAllowsAliasing) {
  using T = TypeParam;
  const int32_t n = 6;
  const auto a0 = qdm_test::RandomMatrix<T>(n, n, 3);
  const auto b0 = qdm_test::RandomMatrix<T>(n, n, 4);
  const auto want = qdm_test::NaiveProduct(a0.data(), b0.data(), n, n, n);

  auto a = a0;  // C = A
  ASSERT_EQ(MatMul<T>(a.data(), b0.data(), n, n, n, a.data(), true), 0);
  EXPECT_LT(ScaledError(a, want, n), 4.0);
  auto b = b0;  // C = B
  ASSERT_EQ(MatMul<T>(a0.data(), b.data(), n, n, n, b.data(), true), 0);
  EXPECT_LT(ScaledError(b, want, n), 4.0);
}

TYPED_TEST(ProductsTyped, CopyingWorkerFailedAllocationLeavesCUntouched) {
  using T = TypeParam;
  const auto a = qdm_test::RandomMatrix<T>(3, 4, 5);
  const auto b = qdm_test::RandomMatrix<T>(4, 2, 6);
  std::vector<T> c(6, T(9.0));
  const int64_t allocations = qdm_test::FailEachAllocation(
      [&] { return MatMul<T>(a.data(), b.data(), 3, 4, 2, c.data(), true); },
      [&] {
        for (const T& v : c) EXPECT_EQ(v, T(9.0));
      });
  EXPECT_EQ(allocations, 3);
}

// ---- row blocking of the real product -------------------------------------------------

TEST(MatMulBlocking, TallProductIsSplitInto1530RowBlocks) {
  struct Case {
    Dims d;
    std::vector<int> rows;  // M of each dgemm call
  } cases[] = {
      {{1531, 257, 3}, {1530, 1}},   {{1530, 257, 3}, {1530}},       {{1531, 256, 3}, {1531}},
      {{1531, 257, 2}, {1531}},      {{3060, 257, 3}, {1530, 1530}},
      {{3061, 300, 4}, {1530, 1530, 1}},
  };
  for (const Case& c : cases) {
    const Dims d = c.d;
    SCOPED_TRACE(::testing::Message() << d.m << "x" << d.k << "x" << d.n);
    const auto a = qdm_test::RandomMatrix<double>(d.m, d.k, 7);
    const auto b = qdm_test::RandomMatrix<double>(d.k, d.n, 8);
    std::vector<double> out(static_cast<size_t>(d.m) * d.n, 5.0);
    g_dgemm_calls = 0;
    g_dgemm_rows.clear();
    ASSERT_EQ(MatMulReal(a.data(), b.data(), d.m, d.k, d.n, out.data()), 0);
    EXPECT_EQ(g_dgemm_rows, c.rows);
    EXPECT_EQ(g_dgemm_calls, static_cast<int>(c.rows.size()));
    EXPECT_LT(ScaledError(out, qdm_test::NaiveProduct(a.data(), b.data(), d.m, d.k, d.n), d.k),
              4.0);
  }
}

TEST(MatMulBlocking, ComplexProductIsOneCall) {
  const Dims d{1531, 257, 3};
  const auto a = qdm_test::RandomMatrix<Cx>(d.m, d.k, 9);
  const auto b = qdm_test::RandomMatrix<Cx>(d.k, d.n, 10);
  std::vector<Cx> out(static_cast<size_t>(d.m) * d.n);
  g_zgemm_calls = 0;
  ASSERT_EQ(MatMulComplex(a.data(), b.data(), d.m, d.k, d.n, out.data()), 0);
  EXPECT_EQ(g_zgemm_calls, 1);
  EXPECT_LT(ScaledError(out, qdm_test::NaiveProduct(a.data(), b.data(), d.m, d.k, d.n), d.k),
            4.0);
}

// ---- vector helpers ----------------------------------------------------------------------

TEST(VectorHelpers, SizeBelowOneIsRejectedAndNothingWritten) {
  for (int32_t n : {0, -1}) {
    double x = 1.5, y = 2.5, out = 9.0;
    EXPECT_EQ(DotReal(&x, &y, n, &out), -20003);
    EXPECT_EQ(VecSubReal(&x, &y, n, &out), -20003);
    EXPECT_EQ(out, 9.0);
  }
}

TEST(VectorHelpers, ElementWiseResults) {
  const std::vector<double> a = {1.0, -2.0, 3.5, 1e300, -0.0};
  const std::vector<double> b = {0.5, 4.0, 3.5, -1e300, 0.0};
  const int32_t n = static_cast<int32_t>(a.size());

  double dot = 0.0;
  ASSERT_EQ(DotReal(a.data(), b.data(), 3, &dot), 0);
  EXPECT_DOUBLE_EQ(dot, 0.5 - 8.0 + 12.25);

  std::vector<double> out(a.size());
  ASSERT_EQ(VecSubReal(a.data(), b.data(), n, out.data()), 0);
  for (int32_t i = 0; i < n; ++i) EXPECT_EQ(out[i], a[i] - b[i]);

}


// ---- finiteness screen ----------------------------------------------------------------------

TEST(FinitenessScreen, BoundaryValues) {
  const double lowest = -DBL_MAX;  // -1.7976931348623157e308
  struct Case {
    double v;
    int32_t rejected;
  } cases[] = {
      {1.0, 0},
      {0.0, 0},
      {DBL_MAX, 1},
      {std::nextafter(DBL_MAX, 0.0), 0},
      {lowest, 1},
      {-1.7976931348623e308, 1},
      {std::nextafter(-1.7976931348623e308, 0.0), 0},
      {-1.797693134862e308, 0},
      {INFINITY, 1},
      {-INFINITY, 1},
      {std::nan(""), 1},
      {-std::nan(""), 1},
      {std::numeric_limits<double>::denorm_min(), 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.v);
    EXPECT_EQ(HasNonFiniteReal(&c.v, 1), c.rejected);
    const double pair[2] = {1.0, c.v};
    EXPECT_EQ(HasNonFiniteReal(pair, 2), c.rejected);
    const Cx in_real(c.v, 0.5), in_imag(0.5, c.v);
    EXPECT_EQ(HasNonFiniteComplex(&in_real, 1), c.rejected);
    EXPECT_EQ(HasNonFiniteComplex(&in_imag, 1), c.rejected);
  }
  const double two[2] = {1.0, DBL_MAX};
  EXPECT_EQ(HasNonFiniteReal(two, 2), 1);
  EXPECT_EQ(HasNonFiniteReal(two, 1), 0);  // only the first n values are visited
  EXPECT_EQ(HasNonFiniteReal(two, 0), 0);
  EXPECT_EQ(HasNonFiniteReal(nullptr, 0), 0);
  EXPECT_EQ(HasNonFiniteComplex(nullptr, -3), 0);
}

// ---- transposes ---------------------------------------------------------------------------

TEST(Transpose, InPlaceTwoByThree) {
  double a[6] = {1, 2, 3, 4, 5, 6};
  ASSERT_EQ(TransposeReal(a, 2, 3, nullptr), 0);
  const double want[6] = {1, 4, 2, 5, 3, 6};
  for (int i = 0; i < 6; ++i) EXPECT_EQ(a[i], want[i]);
}

TEST(Transpose, ConjugateFlipsImaginarySignBitOnly) {
  Cx a[2] = {Cx(1.0, 0.0), Cx(-0.0, -2.0)};  // 1-by-2
  Cx out[2];
  ASSERT_EQ(ConjTransposeComplex(a, 1, 2, out), 0);
  EXPECT_TRUE(std::signbit(out[0].imag()));
  EXPECT_FALSE(std::signbit(out[0].real()));
  EXPECT_TRUE(std::signbit(out[1].real()));
  EXPECT_EQ(out[1].imag(), 2.0);
}

template <typename T>
StatusCode TransposeNamed(T* A, int32_t m, int32_t n, T* out) {
  if constexpr (qdm_test::kIsCx<T>) {
    return ConjTransposeComplex(A, m, n, out);
  } else {
    return TransposeReal(A, m, n, out);
  }
}

TYPED_TEST(ProductsTyped, TransposeMatchesLoopOutOfPlaceAndInPlace) {
  using T = TypeParam;
  const Dims shapes[] = {{1, 0, 1}, {1, 0, 5}, {5, 0, 1}, {2, 0, 3}, {7, 0, 4}, {13, 0, 13}};
  for (const Dims& d : shapes) {
    SCOPED_TRACE(::testing::Message() << d.m << "x" << d.n);
    const auto a = qdm_test::RandomMatrix<T>(d.m, d.n, 11);
    const auto want = qdm_test::NaiveAdjoint(a.data(), d.m, d.n);
    auto src = a;
    std::vector<T> out(a.size());
    ASSERT_EQ(TransposeNamed(src.data(), d.m, d.n, out.data()), 0);
    EXPECT_EQ(out, want);
    EXPECT_EQ(src, a);
    ASSERT_EQ(TransposeNamed(src.data(), d.m, d.n, static_cast<T*>(nullptr)), 0);
    EXPECT_EQ(src, want);
  }
  T x = T(1.0);
  for (const Dims& bad : {Dims{0, 0, 3}, Dims{3, 0, 0}, Dims{-1, 0, 2}}) {
    EXPECT_EQ(TransposeNamed(&x, bad.m, bad.n, &x), -20003);
    EXPECT_EQ(TransposeNamed(&x, bad.m, bad.n, static_cast<T*>(nullptr)), -20003);
  }
}

TYPED_TEST(ProductsTyped, InPlaceTransposeFailedScratchLeavesAUntouched) {
  using T = TypeParam;
  const auto a0 = qdm_test::RandomMatrix<T>(3, 5, 12);
  auto a = a0;
  const int64_t allocations = qdm_test::FailEachAllocation(
      [&] {
        a = a0;
        return TransposeNamed(a.data(), 3, 5, static_cast<T*>(nullptr));
      },
      [&] { EXPECT_EQ(a, a0); });
  EXPECT_EQ(allocations, 1);
  EXPECT_EQ(a, qdm_test::NaiveAdjoint(a0.data(), 3, 5));
}

}  // namespace
