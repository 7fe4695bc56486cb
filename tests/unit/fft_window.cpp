// Cosine-sum windows against their formulas, and the two-sided power spectrum
// against a direct DFT.

#include <gtest/gtest.h>

#include <cmath>
#include <random>
#include <vector>

#include "fft/fft.h"
#include "numeric/work.h"
#include "support/direct_dft.h"

namespace {

using testing_dft::RandomVector;

struct Window {
  int32_t kind;
  std::vector<double> a;
};

// The cosine-sum coefficients of each window kind.
const Window kWindows[] = {
    {0, {1.0}},
    {1, {0.5, 0.5}},
    {2, {0.54, 0.46}},
    {3, {0.42323, 0.49755, 0.07922}},
    {4, {0.4265907136715391, 0.4965606190885641, 0.07684866723989682}},
    {5, {0.42, 0.5, 0.08}},
    {6, {0.215578948, 0.41663158, 0.277263158, 0.083578947, 0.006947368}},
    {7, {0.35875, 0.48829, 0.14128, 0.01168}},
    {8, {0.27105140069342415, 0.43329793923448606, 0.21812299954311062, 0.0659254463880309,
         0.010811742098372268, 0.0007765848252250934, 1.3887217350903198e-05}},
    {9, {0.323215218, 0.471492057, 0.17553428, 0.028497078, 0.001261367}},
    {11, {0.3635819, 0.4891775, 0.1365995, 0.0106411}},
};

// w[i] = sum_k (-1)^k a_k cos(2 pi k i/n) / (flag ? a_0 : 1), periodic in n.
TEST(FftWindow, CosineSumWindowsMatchTheirFormula) {
  for (const Window& win : kWindows) {
    for (int32_t n : {1, 2, 3, 8, 9, 64, 101, 1000}) {
      for (int32_t flag : {0, 1}) {
        const std::vector<double> x0 = RandomVector(n, 5 + n);
        std::vector<double> x = x0;
        ASSERT_EQ(ApplyWindow(x.data(), n, win.kind, flag), 0);
        for (int32_t i = 0; i < n; ++i) {
          long double w = 0.0L;
          for (size_t k = 0; k < win.a.size(); ++k) {
            const long double sign = (k % 2 == 0) ? 1.0L : -1.0L;
            w += sign * win.a[k] *
                 std::cos(6.283185307179586476925286766559L * static_cast<long double>(k * i % n) / n);
          }
          if (flag != 0) w /= win.a[0];
          if (n == 1 || win.a.size() == 1) w = 1.0L;  // left unchanged
          EXPECT_NEAR(x[i], static_cast<double>(x0[i] * w), 1e-13)
              << "kind " << win.kind << " n " << n << " i " << i << " flag " << flag;
        }
      }
    }
  }
}

TEST(FftWindow, UnknownKindsAndEmptyArraysAreRejectedUntouched) {
  std::vector<double> x = RandomVector(16, 3);
  const std::vector<double> x0 = x;
  for (int32_t kind : {10, -1, 12, 100}) EXPECT_EQ(ApplyWindow(x.data(), 16, kind, 0), -20061);
  EXPECT_EQ(ApplyWindow(x.data(), 0, 1, 0), -20003);
  EXPECT_EQ(ApplyWindow(x.data(), -4, 1, 0), -20003);
  EXPECT_EQ(x, x0);
}

// |X[k]|^2 / n^2 for every k, from a direct DFT.
TEST(FftWindow, PowerSpectrumMatchesDirectDft) {
  for (int32_t n : {1, 2, 5, 64, 106, 736, 1000, 1009}) {
    const std::vector<double> x0 = RandomVector(n, 11 + n);
    std::vector<double> x = x0;
    ASSERT_EQ(PowerSpectrumReal(x.data(), n), 0);
    std::vector<int64_t> bins;
    for (int64_t k = 0; k < n; ++k) bins.push_back(k);
    std::vector<long double> re, im;
    testing_dft::DirectDft(x0, std::vector<double>(n, 0.0), bins, &re, &im);
    long double peak = 0.0L;
    for (int32_t k = 0; k < n; ++k) peak = std::max(peak, (re[k] * re[k] + im[k] * im[k]) / n / n);
    for (int32_t k = 0; k < n; ++k) {
      const long double expect = (re[k] * re[k] + im[k] * im[k]) / n / n;
      EXPECT_NEAR(x[k], static_cast<double>(expect), 1e-14 * static_cast<double>(peak))
          << "n " << n << " k " << k;
    }
  }
  std::vector<double> x = {2.0};
  EXPECT_EQ(PowerSpectrumReal(x.data(), 0), -20003);
  EXPECT_EQ(x[0], 2.0);
}

TEST(FftWindow, PowerSpectrumAllocationFailureLeavesInputAndLeaksNothing) {
  for (int32_t n : {64, 46, 106}) {
    const std::vector<double> x0 = RandomVector(n, 99);
    const int64_t before = NumAllocOutstanding();
    bool completed = false;
    for (int64_t k = 1; !completed && k < 1000; ++k) {
      std::vector<double> x = x0;
      NumAllocFailAt(k, false);
      const StatusCode st = PowerSpectrumReal(x.data(), n);
      completed = NumAllocAttempts() < k;
      NumAllocFailAt(0, false);
      ASSERT_EQ(NumAllocOutstanding(), before);
      if (st != 0) {
        ASSERT_EQ(st, -20001);
        ASSERT_EQ(x, x0);
      }
      if (completed) {
        EXPECT_EQ(st, 0);
      }
    }
    EXPECT_TRUE(completed);
  }
}

}  // namespace
