// Fault injection over NumAlloc: runs a call with its k-th allocation failing,
// for k = 1, 2, ... until a run completes without reaching the injected fault.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>

#include "core/types.h"
#include "numeric/work.h"

namespace qdm_test {

// `call` returns a StatusCode and must start from the same inputs each time
// (rebuild them inside it). Every faulted run must end in kNoMemory, with no
// block left outstanding, after which `after_failure` checks the outputs. The
// final, unfaulted run must end in one of `ok1`/`ok2`. Returns the number of
// allocations of that run. With `persistent`, every allocation from the k-th on
// fails.
template <typename Call, typename AfterFailure>
int64_t FailEachAllocation(Call call, AfterFailure after_failure, bool persistent = false,
                           StatusCode ok1 = status::kOk, StatusCode ok2 = status::kOk) {
  const int64_t outstanding = NumAllocOutstanding();
  for (int64_t k = 1; k < 10000; ++k) {
    NumAllocFailAt(k, persistent);
    const StatusCode st = call();
    const int64_t attempts = NumAllocAttempts();
    NumAllocFailAt(0, false);
    EXPECT_EQ(NumAllocOutstanding(), outstanding) << "leak with allocation " << k << " failing";
    if (attempts < k) {  // the fault was never reached: a clean run
      EXPECT_TRUE(st == ok1 || st == ok2) << "clean run returned " << st;
      return attempts;
    }
    EXPECT_EQ(st, status::kNoMemory) << "allocation " << k << " failing";
    if (st != status::kNoMemory) return -1;
    after_failure();
  }
  ADD_FAILURE() << "no clean run";
  return -1;
}

}  // namespace qdm_test
