// The Krylov route from many threads at once: the FFT plans are the only
// thing calls share, and each call started alongside others must give, bit for
// bit, what it gives alone. Lengths repeat across the mix so that threads
// acquire and release the same plans while others use them.
#include <gtest/gtest.h>

#include <atomic>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <string>
#include <thread>
#include <vector>

#include "qdm_api.h"

namespace {

struct Case {
  int32_t n, L, M;
  bool complex;
};

std::vector<double> Record(const Case& c) {
  std::vector<double> x(size_t(c.n) * (c.complex ? 2 : 1));
  for (int32_t t = 0; t < c.n; ++t) {
    const double a = std::exp(-0.002 * t), b = std::exp(-0.004 * t);
    const double re = a * std::cos(0.61 * t) + 0.7 * b * std::cos(1.9 * t + 0.4) +
                      0.01 * std::sin(12.9898 * t * t);
    if (c.complex) {
      x[2 * size_t(t)] = re;
      x[2 * size_t(t) + 1] = a * std::sin(0.61 * t) + 0.7 * b * std::sin(1.9 * t + 0.4);
    } else {
      x[size_t(t)] = re;
    }
  }
  return x;
}

// The status and the bits of every output.
std::vector<uint64_t> Fit(const Case& c, const std::vector<double>& x) {
  std::vector<double> out(4 * size_t(c.M), -7.0);
  int32_t count = -7;
  double mse = -7.0;
  double* o = out.data();
  const int32_t M = c.M;
  const int32_t st =
      c.complex ? qdm_matrix_pencil_solver_complex(reinterpret_cast<const qdm_complex*>(x.data()),
                                                   c.n, c.L, M, 1.0, QDM_SOLVER_KRYLOV, o, o + M,
                                                   o + 2 * M, o + 3 * M, &count, &mse)
                : qdm_matrix_pencil_solver_real(x.data(), c.n, c.L, M, 1.0, 1, QDM_SOLVER_KRYLOV, o,
                                                o + M, o + 2 * M, o + 3 * M, &count, &mse);
  std::vector<uint64_t> bits = {uint64_t(uint32_t(st)), uint64_t(uint32_t(count))};
  out.push_back(mse);
  for (double v : out) {
    uint64_t b = 0;
    std::memcpy(&b, &v, sizeof b);
    bits.push_back(b);
  }
  return bits;
}

TEST(PlainThreads, KrylovCallsMadeTogetherMatchCallsMadeAlone) {
  const std::vector<Case> mix = {{600, 200, 4, true},  {600, 200, 2, false}, {601, 200, 4, true},
                                 {900, 300, 6, false}, {900, 300, 3, true},  {1200, 400, 4, true},
                                 {599, 300, 2, false}, {2000, 666, 8, true}};
  std::vector<std::vector<double>> records;
  std::vector<std::vector<uint64_t>> alone;
  for (const Case& c : mix) {
    records.push_back(Record(c));
    alone.push_back(Fit(c, records.back()));
    ASSERT_EQ(alone.back()[0], 0u) << "n " << c.n;
  }
  constexpr int kThreads = 8, kRounds = 3;
  std::atomic<int> ready{0};
  std::vector<std::vector<std::vector<uint64_t>>> got(kThreads);
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      ready.fetch_add(1);
      while (ready.load() < kThreads) std::this_thread::yield();
      for (size_t i = 0; i < kRounds * mix.size(); ++i) {
        const size_t k = (size_t(t) * 3 + i * (2 * size_t(t) + 1)) % mix.size();
        got[size_t(t)].push_back(Fit(mix[k], records[k]));
      }
    });
  }
  for (std::thread& th : threads) th.join();
  for (int t = 0; t < kThreads; ++t) {
    for (size_t i = 0; i < got[size_t(t)].size(); ++i) {
      const size_t k = (size_t(t) * 3 + i * (2 * size_t(t) + 1)) % mix.size();
      EXPECT_EQ(got[size_t(t)][i], alone[k]) << "thread " << t << " case " << k;
    }
  }
}

// Each thread's refusal message is its own: threads refusing different orders
// at once each read back the message of their own last call.
TEST(PlainThreads, EachThreadReadsItsOwnArgumentMessage) {
  constexpr int kThreads = 6, kRounds = 200;
  std::vector<double> x(30, 1.0);  // floor(2n/3) = 20
  std::atomic<int> ready{0}, wrong{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      ready.fetch_add(1);
      while (ready.load() < kThreads) std::this_thread::yield();
      double a[64], v = 0.0;
      qdm_complex poles[64];
      for (int i = 0; i < kRounds; ++i) {
        const int32_t order = 21 + t;
        const int32_t s = qdm_covariance_real(x.data(), 30, order, a, poles, &v);
        std::this_thread::yield();
        char text[128];
        qdm_last_error_message(text, sizeof text);
        const std::string want =
            "order " + std::to_string(order) + " is above floor(2n/3) = 20 (n = 30)";
        if (s != QDM_ERR_COUNT || want != text) wrong.fetch_add(1);
      }
    });
  }
  for (std::thread& th : threads) th.join();
  EXPECT_EQ(wrong.load(), 0);
}

}  // namespace
