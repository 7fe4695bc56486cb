// Accuracy of the complex and real transforms against a direct long-double
// DFT: every length 1..1100 and a set of larger lengths chosen to put every
// kernel kind (specialised radices, generic primes 23/47, Rader primes,
// nested Rader) in leaf and combining positions, in several stride layouts.
// Bound: relative RMS error <= 20 eps log2(n); the worst ratio is printed.

#include <gtest/gtest.h>

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <random>
#include <vector>

#include "fft/fft.h"
#include "fft/wide_lanes.h"
#include "support/direct_dft.h"

namespace {

constexpr double kBound = 20.0;  // in units of eps * log2(n)

struct Ratios {
  double complex_ratio;
  double real_ratio;
};

double RelRms(const std::vector<double>& got, const std::vector<long double>& ref) {
  long double err = 0.0L, norm = 0.0L;
  for (size_t i = 0; i < ref.size(); ++i) {
    const long double d = got[i] - ref[i];
    err += d * d;
    norm += ref[i] * ref[i];
  }
  return norm == 0.0L ? static_cast<double>(std::sqrt(err)) : static_cast<double>(std::sqrt(err / norm));
}

// Runs both drivers in two stride layouts each and returns the worst error
// ratios over the layouts.
Ratios CheckLength(int32_t n) {
  std::mt19937_64 rng(0x9e3779b97f4a7c15ULL ^ static_cast<uint64_t>(n));
  std::uniform_real_distribution<double> uni(-1.0, 1.0);
  std::vector<double> re(n), im(n), zero(n, 0.0);
  for (int32_t j = 0; j < n; ++j) {
    re[j] = uni(rng);
    im[j] = uni(rng);
  }
  // Bins: all of them up to 4096, otherwise a fixed random sample. The real
  // transform is checked on the bins k <= n/2 it stores.
  std::vector<int64_t> bins, rbins;
  if (n <= 4096) {
    for (int64_t k = 0; k < n; ++k) bins.push_back(k);
  } else {
    std::mt19937_64 pick(12345);
    bins = {0, 1, n / 2, n - 1};
    for (int i = 0; i < 60; ++i) bins.push_back(static_cast<int64_t>(pick() % n));
  }
  for (int64_t k : bins) rbins.push_back(std::min(k, n - k));
  std::sort(rbins.begin(), rbins.end());
  rbins.erase(std::unique(rbins.begin(), rbins.end()), rbins.end());
  std::vector<long double> xr, xi, rr, ri;
  testing_dft::DirectDft(re, im, bins, &xr, &xi);
  testing_dft::DirectDft(re, zero, rbins, &rr, &ri);

  // Oracle vectors: complex as (re, im) per bin; real in packed order.
  std::vector<long double> cref;
  for (size_t b = 0; b < bins.size(); ++b) {
    cref.push_back(xr[b]);
    cref.push_back(xi[b]);
  }
  std::vector<long double> rref;
  std::vector<int64_t> rpos;  // packed positions matching rref
  for (size_t b = 0; b < rbins.size(); ++b) {
    const int64_t k = rbins[b];
    rref.push_back(rr[b]);
    rpos.push_back(k);
    if (k != 0 && 2 * k != n) {
      rref.push_back(ri[b]);
      rpos.push_back(n - k);
    }
  }

  FftPlan* plan = FftPlanAcquire(n);
  EXPECT_NE(plan, nullptr);
  if (plan == nullptr) return {1e300, 1e300};
  const double unit = DBL_EPSILON * std::max(1.0, std::log2(static_cast<double>(n)));
  Ratios worst{0.0, 0.0};

  // Complex, layout 1: interleaved in and out (base, base + 1, stride 2).
  // Layout 2: split input at stride 3, split output at stride 1.
  for (int layout = 0; layout < 2; ++layout) {
    const int32_t is = layout == 0 ? 2 : 3;
    const int32_t os = layout == 0 ? 2 : 1;
    std::vector<double> in_re(static_cast<size_t>(n) * is), in_im(static_cast<size_t>(n) * is);
    std::vector<double> out_re(static_cast<size_t>(n) * os), out_im(static_cast<size_t>(n) * os);
    const double* pr;
    const double* pi;
    double* qr;
    double* qi;
    if (layout == 0) {
      for (int32_t j = 0; j < n; ++j) {
        in_re[2 * j] = re[j];
        in_re[2 * j + 1] = im[j];
      }
      pr = in_re.data();
      pi = in_re.data() + 1;
      qr = out_re.data();
      qi = out_re.data() + 1;
    } else {
      for (int32_t j = 0; j < n; ++j) {
        in_re[3 * j] = re[j];
        in_im[3 * j] = im[j];
      }
      pr = in_re.data();
      pi = in_im.data();
      qr = out_re.data();
      qi = out_im.data();
    }
    EXPECT_EQ(FftComplex(plan, pr, pi, qr, qi, is, os, n), 0);
    std::vector<double> got;
    for (int64_t k : bins) {
      got.push_back(qr[k * os]);
      got.push_back(qi[k * os]);
    }
    worst.complex_ratio = std::max(worst.complex_ratio, RelRms(got, cref) / unit);
  }

  // Real, layout 1: unit strides; layout 2: input stride 2, output stride 3.
  for (int layout = 0; layout < 2; ++layout) {
    const int32_t is = layout == 0 ? 1 : 2;
    const int32_t os = layout == 0 ? 1 : 3;
    std::vector<double> in(static_cast<size_t>(n) * is), out(static_cast<size_t>(n) * os);
    for (int32_t j = 0; j < n; ++j) in[static_cast<size_t>(j) * is] = re[j];
    EXPECT_EQ(FftReal(plan, in.data(), out.data(), is, os, n), 0);
    std::vector<double> got;
    for (int64_t p : rpos) got.push_back(out[p * os]);
    worst.real_ratio = std::max(worst.real_ratio, RelRms(got, rref) / unit);
  }
  FftPlanRelease(plan);
  return worst;
}

void CheckLengths(const std::vector<int32_t>& lengths, const char* label) {
  Ratios worst{0.0, 0.0};
  int32_t worst_c = 0, worst_r = 0;
  for (int32_t n : lengths) {
    const Ratios r = CheckLength(n);
    EXPECT_LE(r.complex_ratio, kBound) << "complex n = " << n;
    EXPECT_LE(r.real_ratio, kBound) << "real n = " << n;
    if (r.complex_ratio > worst.complex_ratio) worst.complex_ratio = r.complex_ratio, worst_c = n;
    if (r.real_ratio > worst.real_ratio) worst.real_ratio = r.real_ratio, worst_r = n;
  }
  std::printf("[ accuracy ] %s: worst complex %.3f (n = %d), worst real %.3f (n = %d) "
              "x eps*log2(n), bound %.0f\n",
              label, worst.complex_ratio, worst_c, worst.real_ratio, worst_r, kBound);
}

std::vector<int32_t> Range(int32_t lo, int32_t hi) {
  std::vector<int32_t> v;
  for (int32_t n = lo; n <= hi; ++n) v.push_back(n);
  return v;
}

// Every length 1..1100, in four slices of similar cost.
TEST(FftAccuracy, Lengths1To693) { CheckLengths(Range(1, 693), "n = 1..693"); }
TEST(FftAccuracy, Lengths694To873) { CheckLengths(Range(694, 873), "n = 694..873"); }
TEST(FftAccuracy, Lengths874To999) { CheckLengths(Range(874, 999), "n = 874..999"); }
TEST(FftAccuracy, Lengths1000To1100) { CheckLengths(Range(1000, 1100), "n = 1000..1100"); }

// Larger lengths: 2*23*53 (all three kinds), 41*43, 43*43 and 43*47 (43 in a
// combining position), 47*53 (generic prime combining), 53*59 (Rader
// combining), primes with Rader sub-plans of several shapes, powers of two.
TEST(FftAccuracy, LargeLengths) {
  CheckLengths({2438, 1763, 1849, 2021, 2491, 3127, 4096, 1009, 4999, 10007, 30030, 65536},
               "large lengths");
}

// All outputs of both drivers in interleaved, split and odd-stride layouts,
// so that the four-lane, two-lane and single forms of every kernel all run.
std::vector<double> AllOutputs(int32_t n) {
  const size_t un = static_cast<size_t>(n);
  const std::vector<double> x = testing_dft::RandomVector(6 * un, 0x5eed0000u + un);
  std::vector<double> all;
  FftPlan* plan = FftPlanAcquire(n);
  EXPECT_NE(plan, nullptr);
  if (plan == nullptr) return all;
  std::vector<double> y(6 * un), z(6 * un);
  EXPECT_EQ(FftComplex(plan, x.data(), x.data() + 1, y.data(), y.data() + 1, 2, 2, n), 0);
  all.insert(all.end(), y.begin(), y.begin() + 2 * n);
  EXPECT_EQ(FftComplex(plan, x.data(), x.data() + 3 * un, y.data(), z.data(), 3, 1, n), 0);
  all.insert(all.end(), y.begin(), y.begin() + n);
  all.insert(all.end(), z.begin(), z.begin() + n);
  EXPECT_EQ(FftReal(plan, x.data(), y.data(), 1, 1, n), 0);
  all.insert(all.end(), y.begin(), y.begin() + n);
  EXPECT_EQ(FftReal(plan, x.data(), y.data(), 2, 3, n), 0);
  for (int32_t k = 0; k < n; ++k) all.push_back(y[3 * static_cast<size_t>(k)]);
  FftPlanRelease(plan);
  return all;
}

// The wide (AVX) and SSE2 variants of the kernels run the same operations in
// the same order, so they must agree bit for bit; the accuracy tests above
// cover whichever variant this machine runs by default.
TEST(FftAccuracy, WideAndNarrowKernelsAgreeBitForBit) {
  fftk::SetWideLanes(true);
  if (!fftk::WideLanes()) GTEST_SKIP() << "no wide variant on this machine";
  std::vector<int32_t> lengths = Range(1, 1100);
  for (int32_t n : {1369, 1763, 1849, 2048, 4096, 10007}) lengths.push_back(n);
  int mismatched = 0;
  for (int32_t n : lengths) {
    fftk::SetWideLanes(true);
    const std::vector<double> wide = AllOutputs(n);
    fftk::SetWideLanes(false);
    const std::vector<double> narrow = AllOutputs(n);
    ASSERT_EQ(wide.size(), narrow.size());
    if (std::memcmp(wide.data(), narrow.data(), wide.size() * sizeof(double)) != 0 &&
        ++mismatched <= 5) {
      ADD_FAILURE() << "n = " << n << ": the two variants differ";
    }
  }
  fftk::SetWideLanes(true);
  EXPECT_EQ(mismatched, 0);
}

}  // namespace
