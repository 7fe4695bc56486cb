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
std::atomic<int64_t> g_guards_broken{0};

// Every block is guarded on both sides by bytes the library never uses,
// because optimized BLAS kernels read outside the operands they are given.
// OpenBLAS's complex gemv without transpose (zgemv_n, kernel/x86_64/zgemv_n_4.c
// in its Haswell, Zen, SkylakeX and Sandy Bridge builds) handles a trailing
// pair of rows in a loop that loads the next element of x one iteration early,
// so its last pass reads the 16 bytes one stride of x past x's last element;
// with a negative stride that is |stride| elements before x's first. It reads
// nothing outside A or y. zdotc with a stride other than one
// (kernel/x86_64/zdot.c) does the same to both vectors. Tried against guard
// pages with the Haswell and SkylakeX kernels, no other BLAS routine the
// library calls itself (copy, dot, gemv, gemm, real or complex) reads outside
// its operands: only LAPACK's calls, on work blocks, need the guards. LAPACK hands it rows of a
// column-major matrix as x (stride = the leading dimension: zlarf from the right, in zgebd2 and
// zunml2), and the read then lands on the element of that row one column past
// the matrix: (row + 1) elements past the end of its storage. The rows that
// carry reflectors come before min(rows, columns), so a block of b bytes
// holding such a matrix is overrun by at most 16 * sqrt(b / 16) = 4 sqrt(b)
// bytes. The guard on each side is that bound plus one element, and never less
// than 64 bytes.
//
// Layout: [front guard | block | back guard]. The 16 bytes just before the
// block hold the front guard's length and the block's, for NumFree; the rest
// of both guards is zeroed, so what a kernel reads there is always the same.
constexpr size_t kElement = 16;
constexpr size_t kMinGuard = 64;

size_t GuardBytes(size_t bytes) {
  // ceil(sqrt(bytes / 16)) elements, found without floating point.
  const size_t elements = bytes / kElement + 1;
  size_t root = 1;
  while (root * root < elements) root *= 2;
  size_t lo = root / 2, hi = root;  // lo^2 < elements <= hi^2
  while (hi - lo > 1) {
    const size_t mid = lo + (hi - lo) / 2;
    (mid * mid < elements ? lo : hi) = mid;
  }
  const size_t guard = (hi + 1) * kElement;
  return guard < kMinGuard ? kMinGuard : guard;
}

struct Header {
  size_t front;
  size_t bytes;
};
static_assert(sizeof(Header) == kElement, "the header fills one guard element");

bool InjectFailure() {
  const int64_t attempt = g_attempts.fetch_add(1, std::memory_order_relaxed) + 1;
  const int64_t k = g_fail_at.load(std::memory_order_relaxed);
  if (k <= 0) return false;
  return g_fail_persistent.load(std::memory_order_relaxed) ? attempt >= k : attempt == k;
}

// A guarded block of `bytes` (uninitialised), or null when the sizes overflow
// or malloc fails. No accounting.
void* GuardedAlloc(size_t bytes) {
  const size_t guard = GuardBytes(bytes);
  if (bytes > SIZE_MAX - 2 * guard) return nullptr;
  unsigned char* base = static_cast<unsigned char*>(std::malloc(bytes + 2 * guard));
  if (base == nullptr) return nullptr;
  unsigned char* block = base + guard;
  std::memset(base, 0, guard - sizeof(Header));
  const Header h{guard, bytes};
  std::memcpy(block - sizeof(Header), &h, sizeof h);
  std::memset(block + bytes, 0, guard);
  return block;
}

Header HeaderOf(const void* block) {
  Header h;
  std::memcpy(&h, static_cast<const unsigned char*>(block) - sizeof(Header), sizeof h);
  return h;
}

// True when nothing wrote to either guard: kernels may read the zeroed guards,
// never write them.
bool GuardsIntact(const unsigned char* block, const Header& h) {
  const unsigned char* front = block - h.front;
  unsigned char any = 0;
  for (size_t i = 0; i + sizeof(Header) < h.front; ++i) any |= front[i];
  for (size_t i = 0; i < h.front; ++i) any |= block[h.bytes + i];
  return any == 0;
}

void GuardedFree(void* block) {
  const Header h = HeaderOf(block);
  if (!GuardsIntact(static_cast<const unsigned char*>(block), h)) {
    g_guards_broken.fetch_add(1, std::memory_order_relaxed);
  }
  std::free(static_cast<unsigned char*>(block) - h.front);
}
}  // namespace

StatusCode NumAlloc(void** slot, size_t bytes) {
  void* p = InjectFailure() ? nullptr : GuardedAlloc(bytes);
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
    GuardedFree(ptr);
  }
  return status::kOk;
}

void NumAllocFailAt(int64_t k, bool persistent) {
  g_fail_persistent.store(persistent, std::memory_order_relaxed);
  g_attempts.store(0, std::memory_order_relaxed);
  g_fail_at.store(k, std::memory_order_relaxed);
}

int64_t NumAllocAttempts() { return g_attempts.load(std::memory_order_relaxed); }
int64_t NumAllocOutstanding() { return g_outstanding.load(std::memory_order_relaxed); }

int64_t NumGuardsBroken() { return g_guards_broken.load(std::memory_order_relaxed); }
