#include <gtest/gtest.h>

#include <cstdint>

#include "estimation/estimation.h"

namespace {

TEST(IntLog2, LargestPowerOfTwoNotAbove) {
  const struct {
    int32_t x, e;
  } cases[] = {{INT32_MIN, -1}, {-1, -1}, {0, -1}, {1, 0}, {2, 1}, {3, 1}, {4, 2},
               {1023, 9}, {1024, 10}, {INT32_MAX, 30}};
  for (const auto& c : cases) EXPECT_EQ(IntLog2(c.x), c.e) << c.x;
}

TEST(SpectrumLength, SmallestPowerOfTwoNotBelowM) {
  // Oracle: double until reaching m.
  for (int32_t m = 1; m <= 5000; ++m) {
    int32_t power = 1;
    while (power < m) power *= 2;
    ASSERT_EQ(SpectrumLength(m), power) << m;
  }
  EXPECT_EQ(SpectrumLength(2), 2);
  EXPECT_EQ(SpectrumLength(5), 8);
  EXPECT_EQ(SpectrumLength(512), 512);
  EXPECT_EQ(SpectrumLength(513), 1024);
  EXPECT_EQ(SpectrumLength(INT32_C(1) << 30), INT32_C(1) << 30);
}

TEST(SpectrumLength, NoLengthOutsideThe32BitRange) {
  EXPECT_EQ(SpectrumLength(0), 0);
  EXPECT_EQ(SpectrumLength(-3), 0);
  EXPECT_EQ(SpectrumLength((INT32_C(1) << 30) + 1), 0);
  EXPECT_EQ(SpectrumLength(INT32_MAX), 0);
}

}  // namespace
