// Prediction blocks, reversal and complex difference, checked element by
// element against the prediction equations they stand for.
#include <gtest/gtest.h>

#include <vector>

#include "estimation/estimation.h"

namespace {

std::vector<Complex> Ramp(int n) {
  std::vector<Complex> x(n);
  for (int t = 0; t < n; ++t) x[t] = Complex(t + 1, -10.0 * (t + 1));
  return x;
}

TEST(LinearPrediction, ForwardRowPredictsNextSampleFromPastNearestFirst) {
  for (int n : {2, 3, 7, 12}) {
    for (int p = 1; p < n; ++p) {
      const int q = n - p;
      const std::vector<Complex> x = Ramp(n);
      std::vector<Complex> b(q), A(q * p, Complex(99, 99));
      ASSERT_EQ(BuildForwardMatrixComplex(x.data(), n, p, b.data(), A.data()), 0);
      std::vector<double> xr(n), br(q), Ar(q * p, 99);
      for (int t = 0; t < n; ++t) xr[t] = x[t].real();
      ASSERT_EQ(BuildForwardMatrixReal(xr.data(), n, p, br.data(), Ar.data()), 0);
      for (int i = 0; i < q; ++i) {
        const int target = i + p;
        EXPECT_EQ(b[i], x[target]);
        EXPECT_EQ(br[i], xr[target]);
        for (int j = 0; j < p; ++j) {
          // column j is the sample j+1 steps before the target
          EXPECT_EQ(A[i * p + j], x[target - 1 - j]) << n << " " << p;
          EXPECT_EQ(Ar[i * p + j], xr[target - 1 - j]);
        }
      }
    }
  }
}

TEST(LinearPrediction, BackwardRowPredictsSampleFromFutureNearestFirstWithoutConjugation) {
  for (int n : {2, 5, 9}) {
    for (int p = 1; p < n; ++p) {
      const int q = n - p;
      const std::vector<Complex> x = Ramp(n);
      std::vector<Complex> b(q), A(q * p, Complex(99, 99));
      ASSERT_EQ(BuildBackwardMatrixComplex(x.data(), n, p, b.data(), A.data()), 0);
      std::vector<double> xr(n), br(q), Ar(q * p, 99);
      for (int t = 0; t < n; ++t) xr[t] = x[t].imag();
      ASSERT_EQ(BuildBackwardMatrixReal(xr.data(), n, p, br.data(), Ar.data()), 0);
      for (int i = 0; i < q; ++i) {
        EXPECT_EQ(b[i], x[i]);
        EXPECT_EQ(br[i], xr[i]);
        for (int j = 0; j < p; ++j) {
          EXPECT_EQ(A[i * p + j], x[i + 1 + j]);
          EXPECT_EQ(Ar[i * p + j], xr[i + 1 + j]);
        }
      }
    }
  }
}

TEST(LinearPrediction, ReverseOutOfPlaceAndInPlace) {
  for (int count : {0, 1, 2, 5, 6}) {
    std::vector<double> src(count), dst(count, -1);
    std::vector<Complex> csrc(count), cdst(count);
    for (int k = 0; k < count; ++k) {
      src[k] = k * 1.5;
      csrc[k] = Complex(k, -k);
    }
    ASSERT_EQ(ReverseReal(src.data(), dst.data(), count), 0);
    ASSERT_EQ(ReverseComplex(csrc.data(), cdst.data(), count), 0);
    std::vector<double> inplace = src;
    std::vector<Complex> cinplace = csrc;
    ASSERT_EQ(ReverseReal(inplace.data(), inplace.data(), count), 0);
    ASSERT_EQ(ReverseComplex(cinplace.data(), cinplace.data(), count), 0);
    for (int k = 0; k < count; ++k) {
      EXPECT_EQ(dst[k], src[count - 1 - k]);
      EXPECT_EQ(cdst[k], csrc[count - 1 - k]);
      EXPECT_EQ(inplace[k], src[count - 1 - k]);
      EXPECT_EQ(cinplace[k], csrc[count - 1 - k]);
    }
  }
}

TEST(LinearPrediction, VecSubComplexSubtractsBothPartsAndIgnoresEmptyCount) {
  const Complex u[3] = {{1, 2}, {-3, 4}, {0.5, -0.25}};
  const Complex v[3] = {{0.5, 5}, {3, 4}, {0.5, 0.25}};
  Complex out[3];
  ASSERT_EQ(VecSubComplex(u, v, 3, out), 0);
  EXPECT_EQ(out[0], Complex(0.5, -3));
  EXPECT_EQ(out[1], Complex(-6, 0));
  EXPECT_EQ(out[2], Complex(0, -0.5));
  Complex untouched{7, 7};
  EXPECT_EQ(VecSubComplex(u, v, 0, &untouched), 0);
  EXPECT_EQ(VecSubComplex(u, v, -4, &untouched), 0);
  EXPECT_EQ(untouched, Complex(7, 7));
}

}  // namespace
