// Linked into every test program built from the library's own objects: after
// its tests, no routine may have written into the guards NumAlloc puts around
// each work block (a workspace sized too small for what LAPACK writes, an
// index one past the end).
#include <gtest/gtest.h>

#include "numeric/work.h"

namespace {

class GuardCheck : public ::testing::Environment {
 public:
  void TearDown() override {
    EXPECT_EQ(NumGuardsBroken(), 0) << "blocks released with a write outside them";
  }
};

[[maybe_unused]] const ::testing::Environment* const kGuardCheck =
    ::testing::AddGlobalTestEnvironment(new GuardCheck);

}  // namespace
