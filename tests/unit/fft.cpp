// The FFT engine against a direct long-double DFT, its shared plans, and the
// cosine-sum windows against their spectra. The exports only ever transform
// powers of two, so the prime kernels, Rader plans and windows are reached
// from here alone.

#include <gtest/gtest.h>

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <cstring>
#include <random>
#include <thread>
#include <vector>

#include "fft/fft.h"
#include "fft/plan.h"
#include "fft/wide_lanes.h"
#include "numeric/work.h"

namespace {

using LD = long double;
constexpr LD kTwoPi = 6.283185307179586476925286766559005768L;

std::vector<double> Random(size_t count, uint64_t seed) {
  std::mt19937_64 rng(seed);
  std::uniform_real_distribution<double> uni(-1.0, 1.0);
  std::vector<double> v(count);
  for (double& x : v) x = uni(rng);
  return v;
}

// X[k] = sum_j (re[j] + i im[j]) exp(-2 pi i jk/n) for k in `bins`, directly
// in long double; out gets (Re, Im) per bin.
std::vector<LD> DirectDft(const double* re, const double* im, int64_t n,
                          const std::vector<int64_t>& bins) {
  std::vector<LD> c(n), s(n), out;
  for (int64_t j = 0; j < n; ++j) {
    c[j] = std::cos(kTwoPi * j / n);
    s[j] = -std::sin(kTwoPi * j / n);
  }
  for (int64_t k : bins) {
    LD sr = 0.0L, si = 0.0L;
    for (int64_t j = 0, e = 0; j < n; ++j, e = (e + k) % n) {
      sr += re[j] * c[e] - im[j] * s[e];
      si += re[j] * s[e] + im[j] * c[e];
    }
    out.push_back(sr);
    out.push_back(si);
  }
  return out;
}

// ---- accuracy -------------------------------------------------------------------------
// Both drivers in two stride layouts each (interleaved and split complex data),
// on the wide and the narrow kernel variants. The complex oracle is the direct
// DFT of re + i im; the real one follows from it by conjugate symmetry,
// R[k] = (Z[k] + conj Z[n-k]) / 2, stored as Re R[k] at k <= n/2 and
// Im R[n-k] at k > n/2. Bound: relative RMS error <= 20 eps log2(n)
// over every bin up to n = 4096, over 64 random bins (and their mirrors) above.
// The two variants must agree bit for bit.
void CheckLength(int32_t n) {
  const size_t un = static_cast<size_t>(n);
  const std::vector<double> x = Random(2 * un, 0x9e37 + un);  // re, then im
  std::vector<int64_t> bins, where(un);
  std::mt19937_64 pick(n);
  for (int64_t i = 0; i < (n <= 4096 ? n : 64); ++i) {
    const int64_t k = n <= 4096 ? i : static_cast<int64_t>(pick() % un);
    bins.push_back(k);
    if (n > 4096) bins.push_back((n - k) % n);
  }
  for (size_t b = 0; b < bins.size(); ++b) where[bins[b]] = static_cast<int64_t>(b);
  const std::vector<LD> z = DirectDft(x.data(), x.data() + n, n, bins);
  std::vector<double> il(2 * un), sr(3 * un), si(3 * un);
  for (size_t j = 0; j < un; ++j) {
    il[2 * j] = sr[3 * j] = x[j];
    il[2 * j + 1] = si[3 * j] = x[un + j];
  }
  FftPlan* plan = FftPlanAcquire(n);
  ASSERT_NE(plan, nullptr);
  const double bound = 20.0 * DBL_EPSILON * std::max(1.0, std::log2(n));
  std::vector<double> outputs[2];
  for (bool wide : {true, false}) {
    fftk::SetWideLanes(wide);
    ASSERT_TRUE(wide || !fftk::WideLanes());
    std::vector<double> y1(2 * un), y2r(un), y2i(un), y3(un), y4(3 * un);
    ASSERT_EQ(FftComplex(plan, il.data(), il.data() + 1, y1.data(), y1.data() + 1, 2, 2, n), 0);
    ASSERT_EQ(FftComplex(plan, sr.data(), si.data(), y2r.data(), y2i.data(), 3, 1, n), 0);
    ASSERT_EQ(FftReal(plan, x.data(), y3.data(), 1, 1, n), 0);
    ASSERT_EQ(FftReal(plan, il.data(), y4.data(), 2, 3, n), 0);
    LD err[4] = {}, norm[2] = {};
    for (size_t b = 0; b < bins.size(); ++b) {
      const int64_t k = bins[b], m = where[(n - k) % n];
      const LD zr = z[2 * b], zi = z[2 * b + 1];
      const LD rk = 2 * k <= n ? (zr + z[2 * m]) / 2 : (z[2 * m + 1] - zi) / 2;
      norm[0] += zr * zr + zi * zi;
      norm[1] += rk * rk;
      auto sq = [](LD d) { return d * d; };
      err[0] += sq(y1[2 * k] - zr) + sq(y1[2 * k + 1] - zi);
      err[1] += sq(y2r[k] - zr) + sq(y2i[k] - zi);
      err[2] += sq(y3[k] - rk);
      err[3] += sq(y4[3 * k] - rk);
    }
    for (int t = 0; t < 4; ++t) {
      const LD rel = std::sqrt(err[t] / std::max(norm[t / 2], 1e-300L));
      EXPECT_LE(static_cast<double>(rel), bound)
          << "n = " << n << " transform " << t << (wide ? " wide" : " narrow");
    }
    for (const auto* y : {&y1, &y2r, &y2i, &y3, &y4})
      outputs[wide].insert(outputs[wide].end(), y->begin(), y->end());
  }
  fftk::SetWideLanes(true);
  EXPECT_EQ(std::memcmp(outputs[0].data(), outputs[1].data(), outputs[0].size() * sizeof(double)),
            0)
      << "n = " << n << ": the wide and narrow variants differ";
  FftPlanRelease(plan);
}

// Every length to 1100 puts each specialised radix in leaf and combining
// position with every remainder of the four- and two-lane groups, and the
// generic primes 23 and 47 and the first Rader primes in both. Above: 43 and
// the generic primes combining (41*43, 43*43, 43*47, 47*53), all three kinds
// (2*23*53), Rader combining (53*59), Rader sub-plans of several shapes
// (4999; 10007 -> 5003 -> 61), five factors and deep powers of two.
void CheckLengths(int32_t lo, int32_t hi) {
  for (int32_t n = lo; n <= hi; ++n) CheckLength(n);
}
TEST(Fft, MatchesDirectDftLengths1To800) { CheckLengths(1, 800); }
TEST(Fft, MatchesDirectDftLengths801To1100) { CheckLengths(801, 1100); }
TEST(Fft, MatchesDirectDftLargeLengths) {
  for (int32_t n : {1763, 1849, 2021, 2491, 2438, 3127, 4096, 4999, 10007, 30030, 65536})
    CheckLength(n);
}
// From 16384 up, complex transforms with three or more factors and a
// specialised leaf run every leaf before combining: just below and at that
// length, smallest factors 2, 3 and 5 (moved behind a large first one) and
// 32, leaf radices 32, 16 and 10, the largest 2*3*5 lengths, a generic-prime
// leaf (which keeps the recursion), and 2^20.
TEST(Fft, MatchesDirectDftLeafFirstLengths) {
  for (int32_t n : {16383, 16384, 3 * 8192, 5 * 4096, 15 * 2048, 81 * 625, 2 * 3 * 5 * 4096,
                    23 * 1024, 786432, 1048576})
    CheckLength(n);
}

// ---- the inverse real transform ----------------------------------------------------------
// A random packed half-complex X (any such array is a Hermitian spectrum)
// against the direct sum n x[j] = X0 + 2 sum_(0<k<n/2) (Re Xk cos - Im Xk sin)
// + (-1)^j X(n/2), in long double, at every j up to n = 4096 and 64 random
// ones above; then FftReal of the result must give n X back. Both in two
// stride layouts. Bound as for the forward transforms.
void CheckInverse(int32_t n) {
  const size_t un = static_cast<size_t>(n);
  const std::vector<double> packed = Random(un, 0x51ed + un);
  std::vector<int64_t> points;
  std::mt19937_64 pick(n + 1);
  for (int64_t i = 0; i < (n <= 4096 ? n : 64); ++i)
    points.push_back(n <= 4096 ? i : static_cast<int64_t>(pick() % un));
  std::vector<LD> expect, c(un), sn(un);
  for (size_t e = 0; e < un; ++e) {
    c[e] = std::cos(kTwoPi * e / n);
    sn[e] = std::sin(kTwoPi * e / n);
  }
  LD norm = 0.0L;
  for (int64_t j : points) {
    LD sum = packed[0];
    for (int64_t k = 1, e = j % n; 2 * k < n; ++k, e = (e + j) % n)
      sum += 2.0L * (packed[k] * c[e] - packed[n - k] * sn[e]);
    if (n % 2 == 0) sum += (j % 2 == 0 ? 1 : -1) * static_cast<LD>(packed[n / 2]);
    expect.push_back(sum);
    norm += sum * sum;
  }
  FftPlan* plan = FftPlanAcquire(n);
  ASSERT_NE(plan, nullptr);
  const double bound = 20.0 * DBL_EPSILON * std::max(1.0, std::log2(n));
  std::vector<double> spread(3 * un);  // packed at stride 3
  for (size_t k = 0; k < un; ++k) spread[3 * k] = packed[k];
  struct Layout {
    const double* in;
    int32_t is, os;
  };
  for (const Layout& l : {Layout{packed.data(), 1, 1}, Layout{spread.data(), 3, 2}}) {
    std::vector<double> x(2 * un, 7.0), back(un);
    ASSERT_EQ(FftHalfComplexToReal(plan, l.in, x.data(), l.is, l.os, n), 0);
    LD err = 0.0L;
    for (size_t b = 0; b < points.size(); ++b) {
      const LD d = x[points[b] * l.os] - expect[b];
      err += d * d;
    }
    const LD rel = std::sqrt(err / std::max(norm, 1e-300L));
    EXPECT_LE(static_cast<double>(rel), bound) << "n = " << n << " stride " << l.is;
    if (l.os == 2) {  // the gaps stay untouched
      for (size_t j = 0; j < un; ++j) ASSERT_EQ(x[2 * j + 1], 7.0) << "n = " << n;
    }
    // Round trip: FftReal(x) = n X.
    ASSERT_EQ(FftReal(plan, x.data(), back.data(), l.os, 1, n), 0);
    LD rerr = 0.0L, rnorm = 0.0L;
    for (size_t k = 0; k < un; ++k) {
      const LD want = static_cast<LD>(n) * packed[k];
      rerr += (back[k] - want) * (back[k] - want);
      rnorm += want * want;
    }
    EXPECT_LE(static_cast<double>(std::sqrt(rerr / rnorm)), 2 * bound) << "round trip n = " << n;
  }
  FftPlanRelease(plan);
}

// Odd and even lengths from 1, primes (generic, Rader), 2*3*5 composites and
// their multiples of 2^k, and powers of two to 2^20. Even lengths run on the
// half-length complex plan, odd ones on the forward real transform; the
// round trip's forward transform takes the half-length plan from 1024 on
// (1022 and 1024 the two sides).
TEST(Fft, HalfComplexToRealMatchesDirectSum) {
  for (int32_t n = 1; n <= 64; ++n) CheckInverse(n);
  for (int32_t n : {97,    101,   106,   107,   120,    210,    214,    360,    900,  1000,
                    1024,  1125,  2048,  3000,  3375,   1022,   4096,   4999,   5120, 10007,
                    15360, 30030, 49152, 65536, 245760, 262144, 759375, 1048576})
    CheckInverse(n);
  FftPlan* one = FftPlanAcquire(3);
  double in[3] = {1.0, 2.0, 3.0}, out[3] = {7.0, 7.0, 7.0};
  EXPECT_EQ(FftHalfComplexToReal(one, in, out, 1, 1, 4), -20999);
  EXPECT_EQ(FftHalfComplexToReal(nullptr, in, out, 1, 1, 3), -20999);
  EXPECT_TRUE(out[0] == 7.0 && out[1] == 7.0 && out[2] == 7.0);
  FftPlanRelease(one);
}

// ---- plans ------------------------------------------------------------------------------
// One plan per length, counted; a Rader plan holds its sub-plan (107 -> 106 =
// 2*53 -> 52) as a shared plan; unlinking plans from the middle of the list
// keeps the others findable; the last release frees everything.
TEST(Fft, PlansAreSharedCountedAndFreed) {
  const int64_t before = NumAllocOutstanding();
  FftPlan* a = FftPlanAcquire(107);
  FftPlan* b = FftPlanAcquire(64);
  ASSERT_TRUE(a != nullptr && b != nullptr);
  EXPECT_EQ(FftPlanAcquire(107), a);
  EXPECT_EQ(a->refCount, 2);
  FftPlan* sub = FftPlanAcquire(106);
  EXPECT_EQ(sub, a->stage[0]->raderPlan);
  EXPECT_EQ(sub->refCount, 2);
  FftPlanRelease(a);
  FftPlanRelease(a);
  EXPECT_EQ(sub->refCount, 1);
  EXPECT_EQ(FftPlanAcquire(64), b);
  FftPlanRelease(sub);
  FftPlanRelease(b);
  EXPECT_EQ(b->refCount, 1);
  EXPECT_GT(NumAllocOutstanding(), before);
  FftPlanRelease(b);
  FftPlanRelease(nullptr);
  EXPECT_EQ(NumAllocOutstanding(), before);
  EXPECT_EQ(FftPlanAcquire(0), nullptr);
  // Length mismatches leave the output alone.
  FftPlan* one = FftPlanAcquire(1);
  double in[2] = {0.25, -3.0}, out[2] = {7.0, 7.0};
  EXPECT_EQ(FftComplex(one, in, in + 1, out, out + 1, 2, 2, 2), -1);
  EXPECT_EQ(FftReal(one, in, out, 1, 1, 0), -20999);
  EXPECT_TRUE(out[0] == 7.0 && out[1] == 7.0);
  FftPlanRelease(one);
  // Trial division stops before its square overflows (46340^2 < 2^31).
  int32_t factor[32], kind[32];
  EXPECT_EQ(FftFactorize(INT32_MAX, factor, kind), 1);
  ASSERT_EQ(FftFactorize(46327 * 46337, factor, kind), 2);
  EXPECT_TRUE(factor[0] == 46327 && factor[1] == 46337);
}

// Every allocation of planning, of the half-length plan the real transforms
// of even n build on first use, and of the per-call scratch fails in turn
// (once, then from there on): null or -20001, never a leak, and the run that
// no longer reaches the failure completes.
TEST(Fft, AllocationFailuresGiveNullOrNoMemoryAndLeakNothing) {
  for (int32_t n : {46, 107, 3127, 1030}) {
    const std::vector<double> x = Random(2 * static_cast<size_t>(n), n);
    std::vector<double> y(2 * static_cast<size_t>(n));
    for (bool persistent : {false, true}) {
      const int64_t before = NumAllocOutstanding();
      bool completed = false;
      for (int64_t k = 1; !completed; ++k) {
        NumAllocFailAt(k, persistent);
        FftPlan* plan = FftPlanAcquire(n);
        StatusCode sc = status::kOk, sr = status::kOk, si = status::kOk;
        if (plan != nullptr) {
          sc = FftComplex(plan, x.data(), x.data() + 1, y.data(), y.data() + 1, 2, 2, n);
          sr = FftReal(plan, x.data(), y.data(), 1, 1, n);
          si = FftHalfComplexToReal(plan, x.data(), y.data(), 1, 1, n);
          FftPlanRelease(plan);
        }
        completed = NumAllocAttempts() < k;
        NumAllocFailAt(0, false);
        ASSERT_EQ(NumAllocOutstanding(), before) << "n = " << n << " k = " << k;
        ASSERT_TRUE((sc == 0 || sc == -20001) && (sr == 0 || sr == -20001) &&
                    (si == 0 || si == -20001))
            << sc << " " << sr << " " << si;
        EXPECT_TRUE(!completed || (plan != nullptr && sc == 0 && sr == 0 && si == 0));
      }
    }
  }
}

// Threads acquire, transform and release generic, Rader and nested Rader
// lengths at once, so plans (and the half-length plans of the even real
// transforms, made on first use) are built and freed under one another's
// feet; every result must be the one computed alone.
TEST(Fft, ConcurrentUseGivesSingleThreadedResults) {
  const int32_t lengths[] = {106, 53, 107, 2438, 47, 736, 1000};
  auto run = [](int32_t n) {
    const std::vector<double> x = Random(2 * static_cast<size_t>(n), n);
    std::vector<double> y(4 * static_cast<size_t>(n));
    FftPlan* plan = FftPlanAcquire(n);
    if (plan == nullptr ||
        FftComplex(plan, x.data(), x.data() + 1, y.data(), y.data() + 1, 2, 2, n) != 0 ||
        FftReal(plan, x.data(), y.data() + 2 * n, 1, 1, n) != 0 ||
        FftHalfComplexToReal(plan, x.data(), y.data() + 3 * n, 1, 1, n) != 0)
      y.clear();
    FftPlanRelease(plan);
    return y;
  };
  std::vector<std::vector<double>> alone;
  for (int32_t n : lengths) alone.push_back(run(n));
  const int64_t before = NumAllocOutstanding();
  std::vector<int> mismatches(8, 0);
  std::vector<std::thread> pool;
  for (int t = 0; t < 8; ++t) {
    pool.emplace_back([&, t] {
      for (int i = 3 * t; i < 3 * t + 42; ++i) mismatches[t] += run(lengths[i % 7]) != alone[i % 7];
    });
  }
  for (std::thread& th : pool) th.join();
  for (int t = 0; t < 8; ++t) EXPECT_EQ(mismatches[t], 0) << "thread " << t;
  EXPECT_EQ(NumAllocOutstanding(), before);
}

// ---- power spectrum and windows ------------------------------------------------------------
TEST(Fft, PowerSpectrumIsTheSquaredDirectDft) {
  for (int32_t n : {1, 2, 5, 64, 106, 1009}) {
    const std::vector<double> x0 = Random(static_cast<size_t>(n), 11 + n);
    std::vector<int64_t> bins(n);
    for (int32_t k = 0; k < n; ++k) bins[k] = k;
    const std::vector<LD> z = DirectDft(x0.data(), std::vector<double>(n).data(), n, bins);
    std::vector<double> x = x0;
    ASSERT_EQ(PowerSpectrumReal(x.data(), n), 0);
    for (int32_t k = 0; k < n; ++k) {
      const LD expect = (z[2 * k] * z[2 * k] + z[2 * k + 1] * z[2 * k + 1]) / n / n;
      EXPECT_NEAR(x[k], static_cast<double>(expect), 1e-14) << "n " << n << " k " << k;
    }
  }
  double x = 2.0;
  EXPECT_EQ(PowerSpectrumReal(&x, 0), -20003);
}

// A periodic cosine-sum window of c terms, w[i] = sum_k (-1)^k a_k cos(2 pi k i/n)
// with all a_k > 0, is seen through its direct DFT: real lines of alternating
// sign at bins 0..c-1 (and their mirrors), nothing elsewhere. Every kind's
// coefficients sum to 1, its peak w[n/2]; flag 1 divides by a_0, so the mean
// of w becomes 1. Length 1 and the one-term kind leave x unchanged.
TEST(Fft, WindowsAreCosineSumsWithUnitPeak) {
  const int32_t terms[] = {1, 2, 2, 3, 3, 3, 5, 4, 7, 5, 0, 4};  // by kind
  for (int32_t kind = 0; kind < 12; ++kind) {
    for (int32_t n : {1, 16, 17, 64}) {
      for (int32_t flag : {0, 1}) {
        std::vector<double> w(n, 2.0), zero(n, 0.0);
        if (terms[kind] == 0) {
          EXPECT_EQ(ApplyWindow(w.data(), n, kind, flag), -20061);
          continue;
        }
        ASSERT_EQ(ApplyWindow(w.data(), n, kind, flag), 0);
        for (double& v : w) v /= 2.0;
        std::vector<int64_t> bins(n);
        for (int32_t k = 0; k < n; ++k) bins[k] = k;
        const std::vector<LD> spectrum = DirectDft(w.data(), zero.data(), n, bins);
        const int32_t c = n == 1 ? 1 : terms[kind];
        for (int32_t k = 0; k < n; ++k) {
          const double line = static_cast<double>(spectrum[2 * k] / n) * (k % 2 == 0 ? 1 : -1);
          EXPECT_NEAR(static_cast<double>(spectrum[2 * k + 1]), 0.0, 1e-13) << kind << " " << n;
          if (std::min(k, n - k) >= c) {
            EXPECT_NEAR(line, 0.0, 1e-13) << "kind " << kind << " n " << n << " k " << k;
          } else if (2 * k <= n) {
            EXPECT_GT(line, 1e-6) << "kind " << kind << " n " << n << " k " << k;
          }
        }
        if (flag != 0 || n % 2 == 0) {  // the mean, or the peak of an even length
          const double unit = flag != 0 ? static_cast<double>(spectrum[0] / n) : w[n / 2];
          EXPECT_NEAR(unit, 1.0, 2e-9) << "kind " << kind << " n " << n << " flag " << flag;
        }
      }
    }
  }
  double x = 1.0;
  for (int32_t kind : {-1, 12}) EXPECT_EQ(ApplyWindow(&x, 1, kind, 0), -20061);
  EXPECT_EQ(ApplyWindow(&x, 0, 1, 0), -20003);
}

}  // namespace
