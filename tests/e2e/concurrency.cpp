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

Outcome CallOnce(const QdmApi& qdm, const Export& x) {
  const Scalars s = Valid(x.family);
  Call c = MakeCall(x, s);
  Outcome o;
  o.status = x.invoke(qdm, c, s);
  o.bits = Leftovers(x, c, s);
  return o;
}

TEST(Concurrency, SimultaneousFirstCallsMatchCallsMadeAlone) {
  const QdmApi& qdm = Qdm();
  const std::vector<Export>& exports = Exports();
  constexpr int kThreads = 8;
  constexpr int kRounds = 3;
  std::vector<std::vector<Outcome>> outcomes(kThreads);
  std::atomic<int> ready{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      ready.fetch_add(1);
      while (ready.load() < kThreads) std::this_thread::yield();
      // Each thread starts at a different export; every one begins with a resize.
      for (int r = 0; r < kRounds; ++r) {
        for (size_t i = 0; i < exports.size(); ++i) {
          const size_t e = (i + static_cast<size_t>(t) * 3) % exports.size();
          outcomes[static_cast<size_t>(t)].push_back(CallOnce(qdm, exports[e]));
        }
      }
    });
  }
  for (std::thread& th : threads) th.join();

  std::vector<Outcome> alone;
  for (const Export& x : exports) alone.push_back(CallOnce(qdm, x));
  for (int t = 0; t < kThreads; ++t) {
    size_t k = 0;
    for (int r = 0; r < kRounds; ++r) {
      for (size_t i = 0; i < exports.size(); ++i, ++k) {
        const size_t e = (i + static_cast<size_t>(t) * 3) % exports.size();
        EXPECT_EQ(outcomes[static_cast<size_t>(t)][k], alone[e])
            << exports[e].name << " thread " << t << " round " << r;
      }
    }
  }
}

}  // namespace
