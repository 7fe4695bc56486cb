// Many host threads calling the exports at once, starting together in a
// process where the host function is not yet resolved, so that the first
// resolution races. Each concurrent call must give exactly what the same call
// gives when made alone.
#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "support/export_table.h"

namespace {

using namespace qdmtest;

struct MixedCall {
  const Export* x;
  Scalars s;
};

// The status and everything the call leaves behind.
std::vector<uint64_t> CallOnce(const MixedCall& m) {
  Call c = MakeCall(*m.x, m.s);
  std::vector<uint64_t> bits = {static_cast<uint64_t>(m.x->invoke(Qdm(), c, m.s))};
  for (uint64_t b : Leftovers(*m.x, c, m.s)) bits.push_back(b);
  return bits;
}

TEST(Concurrency, SimultaneousFirstCallsMatchCallsMadeAlone) {
  // Every export with every argument set of its family: short and long
  // records, and spectra whose FFT lengths run from 2 to 4096.
  std::vector<MixedCall> mix;
  for (const Export& x : Exports())
    for (const Scalars& s : ArgumentSets(x.family)) mix.push_back({&x, s});
  constexpr int kThreads = 16, kRounds = 2;
  std::vector<std::vector<std::vector<uint64_t>>> outcomes(kThreads);
  std::atomic<int> ready{0};
  std::vector<std::thread> threads;
  // Each thread starts at a different call of the mix (every one begins with a
  // resize, so the first resolution of the host function races) and walks it
  // with its own stride, so that different sizes and FFT lengths overlap.
  auto order = [&](int t, size_t i) {
    return (size_t(t) * 7 + i * (2 * size_t(t) + 1)) % mix.size();
  };
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      ready.fetch_add(1);
      while (ready.load() < kThreads) std::this_thread::yield();
      for (int r = 0; r < kRounds; ++r)
        for (size_t i = 0; i < mix.size(); ++i)
          outcomes[size_t(t)].push_back(CallOnce(mix[order(t, i)]));
    });
  }
  for (std::thread& th : threads) th.join();
  std::vector<std::vector<uint64_t>> alone;
  for (const MixedCall& m : mix) alone.push_back(CallOnce(m));
  for (int t = 0; t < kThreads; ++t)
    for (size_t k = 0, i; k < outcomes[size_t(t)].size(); ++k) {
      i = order(t, k % mix.size());
      EXPECT_EQ(outcomes[size_t(t)][k], alone[i]) << Where(*mix[i].x, mix[i].s) << " thread " << t;
    }
}

}  // namespace
