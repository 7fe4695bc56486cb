// Exhausted work memory through every export: with the fault-injection build
// of the library, the k-th work allocation fails, for k = 1, 2, ... until a
// call completes without reaching it, once failing only the k-th allocation
// and once every allocation from the k-th on. Every faulted call must end in
// success or -20001, empty its outputs on -20001 (MDL: result 0), and leave no
// work memory allocated.
#include <gtest/gtest.h>

#include <string>

#include "support/export_table.h"
#include "support/qdm_host.h"

namespace {

using namespace qdmtest;

struct Faultsim {
  QdmApi qdm;
  void (*failAllocation)(int64_t k, int32_t persistent);
  int64_t (*attempts)();
  int64_t (*outstanding)();
};

const Faultsim& Library() {
  static const Faultsim lib = [] {
    Faultsim f{LoadQdm(QDM_FAULTSIM_LIBRARY_PATH), nullptr, nullptr, nullptr};
    f.failAllocation = reinterpret_cast<decltype(f.failAllocation)>(
        ModuleSymbol(f.qdm.module, "QdmTestFailAllocation"));
    f.attempts =
        reinterpret_cast<decltype(f.attempts)>(ModuleSymbol(f.qdm.module, "QdmTestAllocAttempts"));
    f.outstanding =
        reinterpret_cast<decltype(f.outstanding)>(ModuleSymbol(f.qdm.module, "QdmTestOutstanding"));
    return f;
  }();
  return lib;
}

TEST(FaultInjection, EveryFailedAllocationEndsCleanly) {
  const Faultsim& lib = Library();
  ASSERT_NE(lib.failAllocation, nullptr);
  ASSERT_NE(lib.attempts, nullptr);
  ASSERT_NE(lib.outstanding, nullptr);
  constexpr int64_t kLimit = 200000;
  for (const Export& x : Exports()) {
    const Scalars s = Valid(x.family);
    lib.failAllocation(0, 0);
    Call reference = MakeCall(x, s);
    const int32_t baseline = x.invoke(lib.qdm, reference, s);
    ASSERT_EQ(lib.outstanding(), 0) << x.name;
    for (int32_t persistent : {0, 1}) {
      int64_t k = 1;
      for (; k <= kLimit; ++k) {
        const std::string where = std::string(x.name) + (persistent ? " persistent" : " once") +
                                  " k = " + std::to_string(k);
        Call c = MakeCall(x, s);
        lib.failAllocation(k, persistent);
        const int32_t st = x.invoke(lib.qdm, c, s);
        const bool faulted = lib.attempts() >= k;
        lib.failAllocation(0, 0);
        ASSERT_EQ(lib.outstanding(), 0) << where;
        if (!faulted) {  // the call completed before its k-th allocation
          EXPECT_EQ(st, baseline) << where;
          break;
        }
        ASSERT_TRUE(st == 0 || st == kHostNoMemory) << where << ": status " << st;
        if (st == kHostNoMemory) {
          ExpectEmptied(x, c, where, /*estimatorMayHaveRun=*/true);
          if (x.family == Family::kMdl) {
            EXPECT_EQ(c.order, 0) << where;
          }
        }
      }
      EXPECT_LE(k, kLimit) << x.name;
      RecordProperty(std::string(x.name) + (persistent ? "_persistent" : "_once"),
                     std::to_string(k - 1) + " faulted runs, clean status " +
                         std::to_string(baseline));
    }
  }
}

}  // namespace
