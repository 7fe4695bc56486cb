// Many host threads calling the exports at once, starting together in a
// process where the host function is not yet resolved, so that the first
// resolution races. Each concurrent call must give exactly what the same call
// gives when made alone.
#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <thread>
#include <vector>

#include "support/export_table.h"
#include "support/qdm_host.h"

namespace {

using namespace qdmtest;

// Everything a call leaves behind, doubles as bit patterns (NaN-safe).
struct Outcome {
  int32_t status = 0;
  std::vector<uint64_t> bits;
  bool operator==(const Outcome&) const = default;
};

// One call of the mix: an export and one of its argument sets.
struct MixedCall {
  const Export* x;
  Scalars s;
};

// Every export with every argument set of its family: short and long records,
// and spectra whose FFT lengths run from 2 to 4096.
std::vector<MixedCall> Mix() {
  std::vector<MixedCall> mix;
  for (const Export& x : Exports())
    for (const Scalars& s : ArgumentSets(x.family)) mix.push_back({&x, s});
  return mix;
}

Outcome CallOnce(const QdmApi& qdm, const MixedCall& m) {
  Call c = MakeCall(*m.x, m.s);
  Outcome o;
  o.status = m.x->invoke(qdm, c, m.s);
  o.bits = Leftovers(*m.x, c, m.s);
  return o;
}

TEST(Concurrency, SimultaneousFirstCallsMatchCallsMadeAlone) {
  const QdmApi& qdm = Qdm();
  const std::vector<MixedCall> mix = Mix();
  constexpr int kThreads = 16;
  constexpr int kRounds = 2;
  std::vector<std::vector<Outcome>> outcomes(kThreads);
  std::atomic<int> ready{0};
  std::vector<std::thread> threads;
  // Each thread starts at a different call of the mix (every one begins with a
  // resize, so the first resolution of the host function races) and walks it
  // with its own stride, so that different sizes and FFT lengths overlap.
  auto order = [&](int t, size_t i) {
    const size_t stride = 2 * static_cast<size_t>(t) + 1;
    return (static_cast<size_t>(t) * 7 + i * stride) % mix.size();
  };
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      ready.fetch_add(1);
      while (ready.load() < kThreads) std::this_thread::yield();
      for (int r = 0; r < kRounds; ++r)
        for (size_t i = 0; i < mix.size(); ++i)
          outcomes[static_cast<size_t>(t)].push_back(CallOnce(qdm, mix[order(t, i)]));
    });
  }
  for (std::thread& th : threads) th.join();

  std::vector<Outcome> alone;
  for (const MixedCall& m : mix) alone.push_back(CallOnce(qdm, m));
  for (int t = 0; t < kThreads; ++t) {
    size_t k = 0;
    for (int r = 0; r < kRounds; ++r) {
      for (size_t i = 0; i < mix.size(); ++i, ++k) {
        const MixedCall& m = mix[order(t, i)];
        EXPECT_EQ(outcomes[static_cast<size_t>(t)][k], alone[order(t, i)])
            << m.x->name << " n=" << m.s.n << " size " << m.s.b << " thread " << t;
      }
    }
  }
}

}  // namespace
