// The defaults the plain face hands the Python package and the tool: the MDL
// search's upper order on a table of lengths, and, with the search itself as
// the judge, valid wherever any upper order is.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <vector>

#include "qdm_api.h"

namespace {

TEST(PlainDefaults, MdlUpperOnATableOfLengths) {
  const struct {
    int32_t n, upper;
  } kRows[] = {
      {INT32_MIN, 0}, {-1, 0},   {0, 0},    {1, 0},    {2, 0},       {3, 2},
      {4, 2},         {5, 2},    {6, 2},    {8, 2},    {9, 3},       {64, 21},
      {191, 63},      {192, 64}, {193, 64}, {194, 64}, {150000, 64}, {INT32_MAX, 64},
  };
  for (const auto& row : kRows) {
    EXPECT_EQ(qdm_default_mdl_upper(row.n), row.upper) << "n = " << row.n;
  }
}

// Every length up to 200: the search accepts the default (min_order 1) exactly
// when some upper order from 2 to n is accepted; it never reports a bad upper
// order for it.
TEST(PlainDefaults, MdlUpperIsValidWheneverAnyUpperOrderIs) {
  std::vector<double> x;
  for (int32_t n = 1; n <= 200; ++n) {
    x.assign(size_t(n), 0.0);
    for (int32_t t = 0; t < n; ++t) x[size_t(t)] = std::cos(0.7 * t) + 0.01 * ((t * 37) % 11);
    bool anyValid = false;
    for (int32_t L = 2; L <= n && !anyValid; ++L) {
      int32_t order = 0;
      anyValid = qdm_mdl_order_real(x.data(), n, L, 1, &order) != QDM_ERR_MDL_UPPER;
    }
    const int32_t upper = qdm_default_mdl_upper(n);
    int32_t order = 0;
    const int32_t status = qdm_mdl_order_real(x.data(), n, upper, 1, &order);
    EXPECT_EQ(status != QDM_ERR_MDL_UPPER, anyValid) << "n = " << n << ", upper " << upper;
    EXPECT_EQ(upper == 0, !anyValid) << "n = " << n;
  }
}

}  // namespace
