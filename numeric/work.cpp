#include "numeric/work.h"

#include <atomic>
#include <cstdlib>

#include "core/call_record.h"

namespace {
// Injection state. Counters are atomics so that the accounting stays exact when
// several threads call into the library at once.
std::atomic<int64_t> g_fail_at{0};
std::atomic<bool> g_fail_persistent{false};
std::atomic<int64_t> g_attempts{0};
std::atomic<int64_t> g_outstanding{0};

// Every block gets this much slack past its end. Some optimized BLAS kernels
// (OpenBLAS's complex gemv among them) read a vector's last element as part of
// a wider load, up to 16 bytes past its end; when a block ends at the end of a
// mapped page, that read would fault. The slack keeps it inside the block.
constexpr size_t kSlack = 64;

bool InjectFailure() {
  const int64_t attempt = g_attempts.fetch_add(1, std::memory_order_relaxed) + 1;
  const int64_t k = g_fail_at.load(std::memory_order_relaxed);
  if (k <= 0) return false;
  return g_fail_persistent.load(std::memory_order_relaxed) ? attempt >= k : attempt == k;
}
}  // namespace

StatusCode NumAlloc(void** slot, size_t bytes) {
  void* p = InjectFailure() ? nullptr : std::malloc(bytes + kSlack);
  *slot = p;
  if (p == nullptr) {
    call_record::Note(status::kNoMemory);
    return status::kNoMemory;
  }
  g_outstanding.fetch_add(1, std::memory_order_relaxed);
  return status::kOk;
}

StatusCode NumFree(void* ptr) {
  if (ptr != nullptr) {
    g_outstanding.fetch_sub(1, std::memory_order_relaxed);
    std::free(ptr);
  }
  return status::kOk;
}

StatusCode NumRealloc(void** slot, size_t bytes) {
  void* old = *slot;
  void* p = InjectFailure() ? nullptr : std::realloc(old, bytes + kSlack);
  if (p == nullptr) {
    (void)NumFree(old);
    *slot = nullptr;
    call_record::Note(status::kNoMemory);
    return status::kNoMemory;
  }
  if (old == nullptr) g_outstanding.fetch_add(1, std::memory_order_relaxed);
  *slot = p;
  return status::kOk;
}

void NumAllocFailAt(int64_t k, bool persistent) {
  g_fail_persistent.store(persistent, std::memory_order_relaxed);
  g_attempts.store(0, std::memory_order_relaxed);
  g_fail_at.store(k, std::memory_order_relaxed);
}

int64_t NumAllocAttempts() { return g_attempts.load(std::memory_order_relaxed); }
int64_t NumAllocOutstanding() { return g_outstanding.load(std::memory_order_relaxed); }
