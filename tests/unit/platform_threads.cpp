// The batch threads of the platform layer: every thread asked for runs the
// body once, the caller among them, and all have returned when the call does.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <set>
#include <thread>

#include "core/platform.h"

namespace {

struct Count {
  std::atomic<int> ran{0};
  std::atomic<int> running{0};
  std::atomic<int> most{0};
  std::atomic<bool> caller_ran{false};
  std::thread::id caller;
};

void Body(void* context) {
  auto& c = *static_cast<Count*>(context);
  const int now = ++c.running;
  for (int seen = c.most; now > seen && !c.most.compare_exchange_weak(seen, now);) {
  }
  if (std::this_thread::get_id() == c.caller) c.caller_ran = true;
  std::this_thread::sleep_for(std::chrono::milliseconds(20));  // so the threads overlap
  --c.running;
  ++c.ran;
}

TEST(PlatformThreads, EachThreadRunsTheBodyOnceAndTheCallerIsOne) {
  EXPECT_GE(platform::Processors(), 1);
  EXPECT_LE(platform::Processors(), platform::kMaxThreads);
  for (const int threads : {1, 2, 5}) {
    Count c;
    c.caller = std::this_thread::get_id();
    EXPECT_EQ(platform::RunOnThreads(threads, Body, &c), threads);
    EXPECT_EQ(c.ran, threads);
    EXPECT_EQ(c.running, 0);
    EXPECT_TRUE(c.caller_ran);
    EXPECT_EQ(c.most, threads) << "the threads ran one after another";
  }
}

}  // namespace
