// Work memory. Every block of work memory in the library is obtained through
// NumAlloc and released through NumFree, so that exhausted memory is always
// reported as status::kNoMemory and never throws, and so that tests can make
// the k-th allocation fail.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>

#include "core/types.h"

// Allocates `bytes` uninitialised bytes into *slot (null on failure).
[[nodiscard]] StatusCode NumAlloc(void** slot, size_t bytes);
// Releases a block from NumAlloc; null is allowed. Always 0.
StatusCode NumFree(void* ptr);

// ---- fault injection and accounting, for tests ------------------------------
// Makes the k-th allocation from now (k >= 1) fail; with `persistent` every
// allocation from the k-th on fails. k = 0 switches injection off.
void NumAllocFailAt(int64_t k, bool persistent);
// Number of allocations attempted since the last NumAllocFailAt call.
int64_t NumAllocAttempts();
// Blocks currently allocated and not yet released.
int64_t NumAllocOutstanding();
// Blocks released so far whose guards something had written to: a write
// outside its block, which no routine may make. Tests check it stays 0.
int64_t NumGuardsBroken();

// ---- RAII holder -------------------------------------------------------------
struct NumFreeDeleter {
  void operator()(void* p) const noexcept { (void)NumFree(p); }
};
template <typename T>
using WorkArray = std::unique_ptr<T[], NumFreeDeleter>;

// Work array of `count` elements whose contents are undefined until written:
// for buffers that are filled before they are read. Empty holder on failure (or
// on a byte size that would overflow). A count of 0 still allocates one element
// so that success and failure stay distinguishable.
template <typename T>
WorkArray<T> AllocWorkUninit(size_t count) {
  if (count > SIZE_MAX / sizeof(T)) return WorkArray<T>();
  const size_t bytes = (count == 0 ? 1 : count) * sizeof(T);
  void* p = nullptr;
  if (NumAlloc(&p, bytes) != status::kOk) return WorkArray<T>();
  return WorkArray<T>(static_cast<T*>(p));
}

// The same, zero-filled.
template <typename T>
WorkArray<T> AllocWork(size_t count) {
  WorkArray<T> w = AllocWorkUninit<T>(count);
  if (w) std::memset(static_cast<void*>(w.get()), 0, (count == 0 ? 1 : count) * sizeof(T));
  return w;
}
