// The plain face's fault sweep, shared by its test programs: every allocation
// and every LAPACK driver call of a fit made to fail in turn.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "numeric/lapack_boundary.h"
#include "numeric/work.h"

// Runs call(complex) on either data type under every fault in turn: each
// allocation failed once and from then on, each LAPACK driver call made to
// report INFO 1 or -1. A call that did not reach its fault must give the clean
// result (same(f, clean, where)); one that did must fail with zeroed outputs.
template <typename Call, typename SameFn, typename ZeroedFn>
void FaultSweep(Call call, SameFn same, ZeroedFn zeroed, int64_t* faulted) {
  for (const bool complex : {false, true}) {
    const auto clean = call(complex);
    ASSERT_EQ(clean.status, 0);
    for (int fault = 0; fault < 4; ++fault) {  // allocation once, from; INFO 1, -1
      for (int64_t k = 1;; ++k) {
        if (fault < 2) NumAllocFailAt(k, fault == 1);
        if (fault >= 2) LapackFailAt(k, fault == 3 ? -1 : 1, false);
        const auto f = call(complex);
        const bool reached = (fault < 2 ? NumAllocAttempts() : LapackCalls()) >= k;
        NumAllocFailAt(0, false);
        LapackFailAt(0, 0, false);
        const std::string where = std::string(complex ? "complex" : "real") + " fault " +
                                  std::to_string(fault) + " k " + std::to_string(k);
        ASSERT_EQ(NumAllocOutstanding(), 0) << where;
        if (!reached) {
          same(f, clean, where);
          break;
        }
        EXPECT_LT(f.status, 0) << where;
        EXPECT_TRUE(zeroed(f, complex)) << where;
        ++*faulted;
      }
    }
  }
}
