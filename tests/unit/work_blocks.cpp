// Work blocks: alignment, contents across a resize, exact fault-injection
// accounting, and the guard bytes on both sides that a BLAS kernel may read.
#include <gtest/gtest.h>

#include <cmath>
#include <algorithm>
#include <complex>
#include <cstdint>
#include <cstring>
#include <vector>

#include "numeric/lapack_api.h"
#include "numeric/work.h"

namespace {

// What a kernel may read outside a block of `bytes`: a row of a column-major
// complex matrix filling the block, one column past its end, at most
// 16 * sqrt(bytes / 16) bytes out; at least 64 bytes either way.
size_t ReachOutside(size_t bytes) {
  const double reach = 16.0 * std::ceil(std::sqrt(static_cast<double>(bytes) / 16.0));
  return reach < 64.0 ? 64 : static_cast<size_t>(reach);
}

const size_t kSizes[] = {0, 1, 15, 16, 17, 63, 64, 65, 1000, 4096, 4097, 65536, 1 << 20, 3000017};

TEST(WorkBlocks, AlignedWritableAndGuardedOnBothSides) {
  for (size_t bytes : kSizes) {
    SCOPED_TRACE(bytes);
    void* p = nullptr;
    ASSERT_EQ(NumAlloc(&p, bytes), status::kOk);
    ASSERT_NE(p, nullptr);
    EXPECT_EQ(reinterpret_cast<uintptr_t>(p) % 16, 0u);
    auto* b = static_cast<unsigned char*>(p);
    std::memset(b, 0xA5, bytes);
    // The guards are part of the allocation and read as zeros; the 16 bytes
    // just before the block are the allocator's own and not checked.
    const size_t reach = ReachOutside(bytes);
    size_t nonzero = 0;
    for (size_t i = 0; i < reach; ++i) nonzero += b[bytes + i] != 0;
    for (size_t i = 17; i <= reach; ++i) nonzero += b[-static_cast<ptrdiff_t>(i)] != 0;
    EXPECT_EQ(nonzero, 0u);
    EXPECT_EQ(NumFree(p), status::kOk);
  }
  EXPECT_EQ(NumAllocOutstanding(), 0);
}

TEST(WorkBlocks, InjectedFailuresAreCountedExactly) {
  const struct {
    int64_t fail_at;
    bool persistent;
    int expect_ok;  // of 6 calls: 3 small blocks, then 3 larger ones
  } cases[] = {{0, false, 6}, {1, false, 5}, {4, false, 5}, {6, false, 5},
               {2, true, 1},  {7, false, 6}, {5, true, 4}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.fail_at);
    NumAllocFailAt(c.fail_at, c.persistent);
    void* p[6] = {nullptr, nullptr, nullptr, nullptr, nullptr, nullptr};
    int ok = 0;
    for (int i = 0; i < 6; ++i) {
      const StatusCode st = NumAlloc(&p[i], i < 3 ? 40 : 4000);
      ok += st == status::kOk;
      // A failed allocation leaves null.
      EXPECT_EQ(p[i] == nullptr, st != status::kOk);
    }
    EXPECT_EQ(ok, c.expect_ok);
    EXPECT_EQ(NumAllocAttempts(), 6);
    for (void* q : p) (void)NumFree(q);
    EXPECT_EQ(NumAllocOutstanding(), 0);
  }
  NumAllocFailAt(0, false);
}

// The case that needs the guard: the complex gemv without transpose over a
// trailing pair of rows, with x a row of a column-major matrix that fills a
// work block (stride = its leading dimension), as zlarf applies a reflector
// from the right. The product must be right; under valgrind, the read one
// column past the matrix stays inside the allocation.
TEST(WorkBlocks, ComplexGemvOverAMatrixRowInAWorkBlock) {
  using C = std::complex<double>;
  const struct {
    int rows, cols, m;  // x = last row of rows x cols; y = A(m x cols) x
  } cases[] = {{6, 6, 2}, {10, 7, 6}, {3, 40, 2}, {34, 34, 30}, {2, 200, 2}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.rows * 1000 + c.cols);
    WorkArray<C> host = AllocWork<C>(static_cast<size_t>(c.rows) * c.cols);
    WorkArray<C> a = AllocWork<C>(static_cast<size_t>(c.m) * c.cols);
    ASSERT_TRUE(host && a);
    for (int i = 0; i < c.rows * c.cols; ++i) host[i] = C(i % 5 - 2.0, i % 3);
    for (int i = 0; i < c.m * c.cols; ++i) a[i] = C(i % 7 - 3.0, 1.0 - i % 2);
    const C* x = host.get() + (c.rows - 1);  // last row, stride rows
    std::vector<C> y(c.m), want(c.m);
    for (int r = 0; r < c.m; ++r)
      for (int j = 0; j < c.cols; ++j) want[r] += a[r + int64_t{j} * c.m] * x[int64_t{j} * c.rows];
    const C one(1.0, 0.0), zero(0.0, 0.0);
    cblas_zgemv(CblasColMajor, CblasNoTrans, c.m, c.cols, &one, a.get(), c.m, x, c.rows, &zero,
                y.data(), 1);
    for (int r = 0; r < c.m; ++r) EXPECT_LT(std::abs(y[r] - want[r]), 1e-9) << r;
  }
  EXPECT_EQ(NumAllocOutstanding(), 0);
}

}  // namespace
