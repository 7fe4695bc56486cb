// Every fault injected everywhere, through the exports of the fault-injection
// build of the library (libqdm's code plus hooks on its work memory): for every
// argument set of every export, each work allocation failed in turn, once and
// from then on, and each host resize likewise. Each faulted call is judged by
// FaultedHostCallIsRight against the clean call and leaves no work memory.
#include <gtest/gtest.h>

#include <cstdio>

#include "support/export_table.h"

namespace {

using namespace qdmtest;

constexpr int32_t kResizeError = 3;  // a host memory error

TEST(FaultInjection, EveryFaultGivesTheCleanResultOrTheFailure) {
  static const QdmApi qdm = LoadQdm(QDM_FAULTSIM_LIBRARY_PATH);
  const auto failAllocation = reinterpret_cast<void (*)(int64_t k, int32_t persistent)>(
      ModuleSymbol(qdm.module, "QdmTestFailAllocation"));
  const auto attempts =
      reinterpret_cast<int64_t (*)()>(ModuleSymbol(qdm.module, "QdmTestAllocAttempts"));
  const auto outstanding =
      reinterpret_cast<int64_t (*)()>(ModuleSymbol(qdm.module, "QdmTestOutstanding"));
  ASSERT_TRUE(failAllocation && attempts && outstanding);
  int64_t sets = 0, calls = 0, faults = 0, absorbed = 0, failures = 0;
  for (const Export& x : Exports()) {
    for (const Scalars& s : ArgumentSets(x.family)) {
      ++sets;
      Call reference = MakeCall(x, s);
      ASSERT_EQ(x.invoke(qdm, reference, s), 0) << x.name << ": a failing clean call tests little";
      const std::vector<uint64_t> clean = Leftovers(x, reference, s);
      for (int fault = 0; fault < 4; ++fault) {  // allocation, resize; once, from then on
        const bool resize = fault >= 2, fromThenOn = fault % 2 == 1;
        for (int64_t k = 1;; ++k) {
          const std::string where =
              Where(x, s) + " fault " + std::to_string(fault) + " k=" + std::to_string(k);
          ASSERT_LT(k, 100000) << where << ": no clean run within the limit";
          Call c = MakeCall(x, s);
          if (resize) {
            (fromThenOn ? EmuFailResizesFrom : EmuFailResize)(int32_t(k - 1), kResizeError);
          } else {
            failAllocation(k, fromThenOn ? 1 : 0);
          }
          const int32_t st = x.invoke(qdm, c, s);
          const bool reached = resize ? k <= x.outputs : attempts() >= k;
          failAllocation(0, 0);
          EmuFailResize(0, 0);
          ++calls;
          EXPECT_EQ(outstanding(), 0) << where << ": work memory left allocated";
          if (!reached) {
            EXPECT_TRUE(st == 0 && Leftovers(x, c, s) == clean) << where << ": status " << st;
            break;
          }
          const bool right =
              FaultedHostCallIsRight(x, s, 0, clean, c, st, resize ? kResizeError : 0, fromThenOn);
          absorbed += right && st == 0 && Leftovers(x, c, s) != clean;
          ++faults;
          failures += !right;
          EXPECT_TRUE(right) << where << ": status " << st
                             << ", neither the clean result nor the failure";
        }
      }
    }
  }
  // The figures quoted in the README.
  std::printf(
      "fault injection: %lld argument sets, %lld calls, %lld faults, %lld absorbed by an "
      "ignored solve status, %lld failures\n",
      static_cast<long long>(sets), static_cast<long long>(calls), static_cast<long long>(faults),
      static_cast<long long>(absorbed), static_cast<long long>(failures));
  RecordProperty("calls", std::to_string(calls));
  RecordProperty("faults", std::to_string(faults));
  RecordProperty("absorbed", std::to_string(absorbed));
}

}  // namespace
