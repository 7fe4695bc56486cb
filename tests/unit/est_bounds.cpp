// Work memory carries slack, so a write one past a block goes unseen end to end: here the
// block fillers write into exact blocks before sentinels, and unused window modes are reached.
#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/numeric.h"

namespace {

constexpr double kGuard = -777.0;

template <typename T>
bool GuardIntact(const std::vector<T>& v, size_t used) {
  return std::all_of(v.begin() + used, v.end(), [](T e) { return e == T(kGuard); });
}

TEST(Bounds, PredictionBlocksAndRootSelectionWriteExactlyTheirCells) {
  const int32_t n = 7;
  std::vector<double> x(n);
  std::vector<Complex> xc(n);
  for (int t = 0; t < n; ++t) x[t] = t + 1, xc[t] = Complex(t + 1, -t);
  for (int32_t p = 0; p <= n; ++p) {  // p = 0 and p = n: nothing to write
    const size_t q = size_t(n - p), bUsed = p == 0 ? 0 : q, aUsed = bUsed * size_t(p);
    std::vector<double> b(q + 2, kGuard), A(aUsed + 2, kGuard), bb = b, Ab = A;
    std::vector<Complex> bc(q + 2, kGuard), Ac(aUsed + 2, kGuard);
    ASSERT_EQ(BuildForwardMatrixReal(x.data(), n, p, b.data(), A.data()), 0);
    ASSERT_EQ(BuildForwardMatrixComplex(xc.data(), n, p, bc.data(), Ac.data()), 0);
    ASSERT_EQ(BuildBackwardMatrixReal(x.data(), n, p, bb.data(), Ab.data()), 0);
    EXPECT_TRUE(GuardIntact(b, bUsed) && GuardIntact(A, aUsed) && GuardIntact(bc, bUsed)) << p;
    EXPECT_TRUE(GuardIntact(Ac, aUsed) && GuardIntact(bb, bUsed) && GuardIntact(Ab, aUsed)) << p;
    if (aUsed > 0) {
      EXPECT_EQ(A[aUsed - 1], x[n - p - 1]);
    }  // last row, farthest lag
  }
  const std::vector<Complex> z = {{1.2, 0}, {0.99, 0}, {0, 0.5}, {-1, 0}};
  for (int32_t k = 0; k <= 4; ++k) {
    std::vector<Complex> out(size_t(k) + 2, Complex(kGuard));
    ASSERT_EQ(SelectRootsNearUnitCircle(z.data(), 4, k, out.data()), 0);
    EXPECT_TRUE(GuardIntact(out, size_t(k))) << "k=" << k;
    if (k >= 3) {
      EXPECT_EQ(out[2], Complex(1.2, 0));
    }  // -1, 0.99, 1.2: nearest first
  }
}

}  // namespace

// The differences u - v, real and complex, over every count from 0 to 4: each
// writes exactly its count of cells (a count below 1 writes none), each one
// the difference of its pair.
TEST(Bounds, DifferencesWriteTheirCountAndNoMore) {
  const double u[4] = {5.0, -1.5, 2.25, 8.0}, v[4] = {1.0, 0.5, -0.75, 3.0};
  const Complex cu[4] = {{5, 1}, {-1.5, 2}, {2.25, -3}, {8, 0.5}};
  const Complex cv[4] = {{1, -1}, {0.5, 0.5}, {-0.75, 1}, {3, 2}};
  for (int32_t count = 0; count <= 4; ++count) {
    double out[5] = {-9, -9, -9, -9, -9};
    Complex cout[5] = {-9, -9, -9, -9, -9};
    if (count > 0) {
      ASSERT_EQ(VecSubReal(u, v, count, out), status::kOk);
    }
    ASSERT_EQ(VecSubComplex(cu, cv, count, cout), status::kOk);
    for (int32_t i = 0; i < 5; ++i) {
      EXPECT_EQ(out[i], i < count ? u[i] - v[i] : -9.0) << count << " " << i;
      EXPECT_EQ(cout[i], i < count
                             ? Complex(cu[i].real() - cv[i].real(), cu[i].imag() - cv[i].imag())
                             : Complex(-9.0))
          << count << " " << i;
    }
  }
}
