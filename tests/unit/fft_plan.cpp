// Plans and the shared plan list: factorisation and kinds, stage tables,
// reference counts, driver argument checks, allocation failures at every
// planning and kernel allocation, and concurrent use from many threads.

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <random>
#include <thread>
#include <vector>

#include "fft/fft.h"
#include "fft/plan.h"
#include "numeric/work.h"
#include "support/direct_dft.h"

namespace {

using testing_dft::RandomVector;

// ---- factorisation -----------------------------------------------------------------
struct FactorCase {
  int32_t n;
  std::vector<int32_t> factors;
  std::vector<int32_t> kinds;
};

TEST(FftPlan, FactorisationAndKinds) {
  const FactorCase cases[] = {
      {1, {}, {}},
      {2, {2}, {0}},
      {1000, {10, 10, 10}, {0, 0, 0}},
      {64, {2, 32}, {0, 0}},
      {46, {2, 23}, {0, 1}},
      {106, {2, 53}, {0, 2}},
      {2438, {2, 23, 53}, {0, 1, 2}},
      {1763, {41, 43}, {0, 0}},
      {20, {2, 10}, {0, 0}},
      {2209, {47, 47}, {1, 1}},   // found by trial division
      {2809, {53, 53}, {2, 2}},   // found by trial division
      {65536, {2, 32, 32, 32}, {0, 0, 0, 0}},
      {30030, {3, 7, 10, 11, 13}, {0, 0, 0, 0, 0}},
      {10007, {10007}, {2}},
      {47, {47}, {1}},
  };
  for (const FactorCase& c : cases) {
    FftPlan* plan = FftPlanAcquire(c.n);
    ASSERT_NE(plan, nullptr) << c.n;
    EXPECT_EQ(plan->n, c.n);
    ASSERT_EQ(plan->factorCount, static_cast<int32_t>(c.factors.size())) << c.n;
    int64_t product = 1;
    for (int32_t s = 0; s < plan->factorCount; ++s) {
      EXPECT_EQ(plan->factor[s], c.factors[s]) << c.n << " stage " << s;
      EXPECT_EQ(plan->kind[s], c.kinds[s]) << c.n << " stage " << s;
      EXPECT_EQ(plan->complexLeaf[s] != nullptr, c.kinds[s] == 0) << c.n << " stage " << s;
      EXPECT_EQ(plan->realTwiddle[s] != nullptr, c.kinds[s] == 0) << c.n << " stage " << s;
      EXPECT_EQ(plan->stage[s]->raderPlan != nullptr, c.kinds[s] == 2);
      EXPECT_EQ(plan->stage[s]->primeCos != nullptr, c.kinds[s] == 1);
      EXPECT_EQ(plan->stage[s]->twCos != nullptr, s + 1 < plan->factorCount);
      product *= plan->factor[s];
    }
    EXPECT_EQ(product, c.n);
    FftPlanRelease(plan);
  }
}

// Trial division stops before its square would overflow: a prime near 2^31
// takes it past 46340, whose square is the last below 2^31.
TEST(FftPlan, FactorisationNearTheTopOfTheRange) {
  int32_t factor[32], kind[32];
  for (int32_t prime : {INT32_MAX, 2147483629}) {
    ASSERT_EQ(FftFactorize(prime, factor, kind), 1) << prime;
    EXPECT_EQ(factor[0], prime);
  }
  ASSERT_EQ(FftFactorize(46327 * 46337, factor, kind), 2);
  EXPECT_EQ(factor[0], 46327);
  EXPECT_EQ(factor[1], 46337);
}

// Twiddles: entry (k-1)*(r-1) + (j-1) of stage s is exp(-2 pi i jk/N_s).
TEST(FftPlan, TwiddleTablesMatchTheirAngles) {
  for (int32_t n : {1000, 2438, 4096, 30030}) {
    FftPlan* plan = FftPlanAcquire(n);
    ASSERT_NE(plan, nullptr);
    int64_t len = n;
    for (int32_t s = 0; s + 1 < plan->factorCount; ++s) {
      const int32_t r = plan->factor[s];
      const int64_t m = len / r;
      double worst = 0.0;
      for (int64_t k = 1; k < m; ++k) {
        for (int32_t j = 1; j < r; ++j) {
          const long double angle = 6.283185307179586476925286766559L * (j * k % len) / len;
          const int64_t e = (k - 1) * (r - 1) + (j - 1);
          worst = std::max(worst, std::fabs(plan->stage[s]->twCos[e] - (double)std::cos(angle)));
          worst = std::max(worst, std::fabs(plan->stage[s]->twSin[e] + (double)std::sin(angle)));
        }
      }
      EXPECT_LT(worst, 1e-12) << "n = " << n << " stage " << s;
      len = m;
    }
    FftPlanRelease(plan);
  }
}

// Rader tables: raderInverseIndex lists g^q, raderIndex g^-q, g the smallest
// primitive root; the sub-plan is a shared plan of length r-1.
TEST(FftPlan, RaderTablesAndSubPlan) {
  for (int32_t r : {53, 101, 1009}) {
    int32_t g = 2;
    for (;; ++g) {  // smallest primitive root, by brute force
      int64_t p = 1;
      int32_t order = 0;
      do {
        p = p * g % r;
        ++order;
      } while (p != 1);
      if (order == r - 1) break;
    }
    FftPlan* plan = FftPlanAcquire(r);
    ASSERT_NE(plan, nullptr);
    const FftStage* st = plan->stage[0];
    EXPECT_EQ(st->raderInverseIndex[0], 0);
    EXPECT_EQ(st->raderIndex[0], 0);
    int64_t power = 1;
    for (int32_t q = 0; q <= r - 2; ++q) {
      EXPECT_EQ(st->raderInverseIndex[1 + q], power) << r << " q " << q;
      EXPECT_EQ(static_cast<int64_t>(st->raderIndex[1 + q]) * st->raderInverseIndex[1 + q] % r, 1)
          << r << " q " << q;
      power = power * g % r;
    }
    FftPlan* sub = FftPlanAcquire(r - 1);
    EXPECT_EQ(sub, st->raderPlan);
    EXPECT_EQ(sub->refCount, 2);
    FftPlanRelease(sub);
    FftPlanRelease(plan);
  }
}

// ---- reference counts ------------------------------------------------------------------
TEST(FftPlan, AcquireTwiceSharesThePlanAndTwoReleasesFreeIt) {
  const int64_t before = NumAllocOutstanding();
  FftPlan* a = FftPlanAcquire(777);
  FftPlan* b = FftPlanAcquire(777);
  ASSERT_NE(a, nullptr);
  EXPECT_EQ(a, b);
  EXPECT_EQ(a->refCount, 2);
  FftPlanRelease(b);
  EXPECT_EQ(a->refCount, 1);
  EXPECT_GT(NumAllocOutstanding(), before);
  FftPlanRelease(a);
  EXPECT_EQ(NumAllocOutstanding(), before);
  FftPlanRelease(nullptr);  // allowed
  EXPECT_EQ(FftPlanAcquire(0), nullptr);
  EXPECT_EQ(FftPlanAcquire(-3), nullptr);
}

TEST(FftPlan, NestedRaderPlansAreFreedWithTheirOwner) {
  const int64_t before = NumAllocOutstanding();
  FftPlan* plan = FftPlanAcquire(107);  // 106 = 2*53: a Rader plan inside a Rader plan
  ASSERT_NE(plan, nullptr);
  FftPlan* sub = plan->stage[0]->raderPlan;
  ASSERT_NE(sub, nullptr);
  EXPECT_EQ(sub->n, 106);
  EXPECT_EQ(sub->stage[1]->raderPlan->n, 52);
  FftPlanRelease(plan);
  EXPECT_EQ(NumAllocOutstanding(), before);
}

// ---- driver arguments --------------------------------------------------------------------
TEST(FftPlan, LengthMismatchLeavesOutputUntouched) {
  FftPlan* plan = FftPlanAcquire(16);
  ASSERT_NE(plan, nullptr);
  std::vector<double> in = RandomVector(64, 1);
  std::vector<double> out(64, 7.5);
  for (int32_t n : {15, 17, 1, 0, -16}) {
    EXPECT_EQ(FftComplex(plan, in.data(), in.data() + 1, out.data(), out.data() + 1, 2, 2, n), -1);
    EXPECT_EQ(FftReal(plan, in.data(), out.data(), 1, 1, n), -20999);
  }
  for (double v : out) ASSERT_EQ(v, 7.5);
  FftPlanRelease(plan);
}

TEST(FftPlan, LengthOneCopies) {
  FftPlan* plan = FftPlanAcquire(1);
  ASSERT_NE(plan, nullptr);
  EXPECT_EQ(plan->factorCount, 0);
  const double in[2] = {0.25, -3.0};
  double out[2] = {0.0, 0.0};
  EXPECT_EQ(FftComplex(plan, in, in + 1, out, out + 1, 2, 2, 1), 0);
  EXPECT_EQ(out[0], 0.25);
  EXPECT_EQ(out[1], -3.0);
  double r = 0.0;
  EXPECT_EQ(FftReal(plan, in + 1, &r, 1, 1, 1), 0);
  EXPECT_EQ(r, -3.0);
  FftPlanRelease(plan);
}

// ---- allocation failures ------------------------------------------------------------------
// Fails the k-th allocation (once, then from k on) for k = 1, 2, ... until a
// run completes untouched: planning must give null, transforms -20001, and
// nothing may leak. The lengths reach every allocating path: stage tables,
// prime tables, Rader data and sub-plans, generic and Rader per-call scratch.
TEST(FftPlan, AllocationFailuresGiveNullOrNoMemoryAndNoLeak) {
  for (int32_t n : {1000, 46, 106, 736, 2438, 107, 3127}) {
    const std::vector<double> x = RandomVector(2 * static_cast<size_t>(n), n);
    std::vector<double> ref_c(2 * static_cast<size_t>(n)), ref_r(n);
    {
      FftPlan* plan = FftPlanAcquire(n);
      ASSERT_NE(plan, nullptr);
      ASSERT_EQ(FftComplex(plan, x.data(), x.data() + 1, ref_c.data(), ref_c.data() + 1, 2, 2, n), 0);
      ASSERT_EQ(FftReal(plan, x.data(), ref_r.data(), 2, 1, n), 0);
      FftPlanRelease(plan);
    }
    for (bool persistent : {false, true}) {
      const int64_t before = NumAllocOutstanding();
      bool completed = false;
      bool transform_failed = false;  // a kernel's scratch allocation failed
      for (int64_t k = 1; !completed && k < 10000; ++k) {
        NumAllocFailAt(k, persistent);
        FftPlan* plan = FftPlanAcquire(n);
        StatusCode sc = -20001, sr = -20001;
        std::vector<double> out_c(2 * static_cast<size_t>(n)), out_r(n);
        if (plan != nullptr) {
          sc = FftComplex(plan, x.data(), x.data() + 1, out_c.data(), out_c.data() + 1, 2, 2, n);
          sr = FftReal(plan, x.data(), out_r.data(), 2, 1, n);
          FftPlanRelease(plan);
        }
        completed = NumAllocAttempts() < k;
        NumAllocFailAt(0, false);
        ASSERT_EQ(NumAllocOutstanding(), before) << "n = " << n << " k = " << k;
        ASSERT_TRUE(sc == 0 || sc == -20001) << sc;
        ASSERT_TRUE(sr == 0 || sr == -20001) << sr;
        if (plan != nullptr && (sc != 0 || sr != 0)) transform_failed = true;
        if (completed) {
          ASSERT_NE(plan, nullptr);
          EXPECT_EQ(sc, 0);
          EXPECT_EQ(sr, 0);
          EXPECT_EQ(out_c, ref_c);
          EXPECT_EQ(out_r, ref_r);
        }
      }
      EXPECT_TRUE(completed) << "n = " << n;
      EXPECT_EQ(transform_failed, n != 1000) << "n = " << n;  // 1000 has specialised kernels only
    }
  }
}

// ---- threads ----------------------------------------------------------------------------
// Many threads acquire, transform and release mixed lengths at once (plans are
// created and destroyed under their feet); every result must equal the
// single-threaded one bit for bit.
TEST(FftPlan, ConcurrentUseGivesSingleThreadedResults) {
  const std::vector<int32_t> lengths = {64, 106, 1000, 53, 736, 1763, 2438, 107, 47, 4096};
  std::vector<std::vector<double>> input, ref_c, ref_r;
  for (int32_t n : lengths) {
    input.push_back(RandomVector(2 * static_cast<size_t>(n), 77 + n));
    ref_c.emplace_back(2 * static_cast<size_t>(n));
    ref_r.emplace_back(n);
    FftPlan* plan = FftPlanAcquire(n);
    ASSERT_NE(plan, nullptr);
    ASSERT_EQ(FftComplex(plan, input.back().data(), input.back().data() + 1, ref_c.back().data(),
                         ref_c.back().data() + 1, 2, 2, n), 0);
    ASSERT_EQ(FftReal(plan, input.back().data(), ref_r.back().data(), 2, 1, n), 0);
    FftPlanRelease(plan);
  }
  const int64_t before = NumAllocOutstanding();
  constexpr int kThreads = 8;
  constexpr int kRounds = 6;
  std::vector<int> mismatches(kThreads, 0);
  std::vector<std::thread> pool;
  for (int t = 0; t < kThreads; ++t) {
    pool.emplace_back([&, t] {
      for (int round = 0; round < kRounds; ++round) {
        for (size_t i = 0; i < lengths.size(); ++i) {
          const size_t li = (i + t * 3 + round) % lengths.size();
          const int32_t n = lengths[li];
          FftPlan* plan = FftPlanAcquire(n);
          if (plan == nullptr) {
            ++mismatches[t];
            continue;
          }
          std::vector<double> out_c(2 * static_cast<size_t>(n)), out_r(n);
          const double* x = input[li].data();
          if (FftComplex(plan, x, x + 1, out_c.data(), out_c.data() + 1, 2, 2, n) != 0 ||
              FftReal(plan, x, out_r.data(), 2, 1, n) != 0 || out_c != ref_c[li] ||
              out_r != ref_r[li]) {
            ++mismatches[t];
          }
          FftPlanRelease(plan);
        }
      }
    });
  }
  for (std::thread& th : pool) th.join();
  for (int t = 0; t < kThreads; ++t) EXPECT_EQ(mismatches[t], 0) << "thread " << t;
  EXPECT_EQ(NumAllocOutstanding(), before);
}

}  // namespace
