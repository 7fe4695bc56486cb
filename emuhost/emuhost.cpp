// Emulated host run-time. Blocks are malloc'd (16-byte aligned), so the
// elements, which start at byte 4 as in the host's own blocks, are 4 modulo 8.
#include "emuhost.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <mutex>

extern "C" {
// Probe symbol by which the library recognises a host process.
EMUHOST_API extern const int32_t gGFRTVersion;
const int32_t gGFRTVersion = 0x00070000;
}

namespace {
// Each block remembers its capacity just before the host-visible part, so the
// host-visible block itself is exactly {count, elements...}.
struct Header {
  size_t capacity;  // elements
  size_t elementSize;
  size_t pad;  // keeps the visible block 16-byte aligned
  size_t pad2;
};
static_assert(sizeof(Header) % 16 == 0);

size_t ElementSize(int32_t typeCode) { return typeCode == 13 ? 16 : 8; }

Header* HeaderOf(QdmArrayBlock* block) {
  return reinterpret_cast<Header*>(reinterpret_cast<char*>(block) - sizeof(Header));
}

// Injected failures and the call log share one mutex, so that a log entry and
// the call number it is filed under always agree, also under concurrent calls.
struct ResizeEntry {
  int32_t typeCode;
  int32_t numDims;
  size_t count;
};
constexpr int64_t kLogSize = 1024;
std::mutex g_mutex;
int32_t g_fail_skip = 0;
int32_t g_fail_error = 0;
bool g_fail_persistent = false;
int64_t g_calls = 0;
ResizeEntry g_log[kLogSize];

QdmArrayBlock* AllocBlock(size_t count, size_t elementSize) {
  const size_t bytes = sizeof(Header) + 4 + count * elementSize;
  char* raw = static_cast<char*>(std::calloc(1, bytes));
  if (raw == nullptr) return nullptr;
  Header* h = reinterpret_cast<Header*>(raw);
  h->capacity = count;
  h->elementSize = elementSize;
  return reinterpret_cast<QdmArrayBlock*>(raw + sizeof(Header));
}

// The resize itself, without the bookkeeping of the exported function (so that
// handles made by the helpers below neither count nor use up an injected failure).
int32_t Resize(int32_t typeCode, int32_t numDims, QdmArrayHandle* handle, size_t count) {
  if (typeCode != 10 && typeCode != 13) return 1;
  if (numDims != 1) return 1;
  const size_t es = ElementSize(typeCode);
  if (*handle == nullptr) {
    QdmArrayBlock** h = static_cast<QdmArrayBlock**>(std::malloc(sizeof(QdmArrayBlock*)));
    if (h == nullptr) return 2;
    *h = AllocBlock(count, es);
    if (*h == nullptr) {
      std::free(h);
      return 2;
    }
    *handle = h;
    return 0;
  }
  QdmArrayBlock* old = **handle;
  QdmArrayBlock* nb = AllocBlock(count, es);
  if (nb == nullptr) return 2;
  if (old != nullptr) {
    Header* oh = HeaderOf(old);
    // Keep the count and the elements that fit; only a resize to the same
    // element type keeps meaningful elements, as with the host's own resize.
    const size_t keepBytes = std::min(oh->capacity * oh->elementSize, count * es);
    std::memcpy(nb, old, 4 + keepBytes);
    std::free(oh);
  }
  **handle = nb;
  return 0;
}
}  // namespace

extern "C" {

int32_t NumericArrayResize(int32_t typeCode, int32_t numDims, QdmArrayHandle* handle,
                           size_t count) {
  {
    std::lock_guard<std::mutex> lock(g_mutex);
    ++g_calls;
    g_log[g_calls % kLogSize] = ResizeEntry{typeCode, numDims, count};
    if (g_fail_error != 0) {
      if (g_fail_skip > 0) {
        --g_fail_skip;
      } else {
        const int32_t e = g_fail_error;
        if (!g_fail_persistent) g_fail_error = 0;
        return e;
      }
    }
  }
  return Resize(typeCode, numDims, handle, count);
}

QdmArrayHandle EmuMakeHandle(int32_t typeCode, int32_t count, const double* values) {
  QdmArrayHandle h = nullptr;
  if (Resize(typeCode, 1, &h, count < 0 ? 0 : static_cast<size_t>(count)) != 0) return nullptr;
  std::memcpy(*h, &count, 4);
  if (values != nullptr && count > 0)
    std::memcpy(reinterpret_cast<char*>(*h) + 4, values,
                static_cast<size_t>(count) * ElementSize(typeCode));
  return h;
}

void EmuFreeHandle(QdmArrayHandle handle) {
  if (handle == nullptr) return;
  if (*handle != nullptr) std::free(HeaderOf(*handle));
  std::free(handle);
}

int32_t EmuCount(QdmArrayHandle handle) {
  int32_t c;
  std::memcpy(&c, *handle, 4);
  return c;
}

size_t EmuCapacity(QdmArrayHandle handle) { return HeaderOf(*handle)->capacity; }

void* EmuElements(QdmArrayHandle handle) { return reinterpret_cast<char*>(*handle) + 4; }

void EmuRead(QdmArrayHandle handle, double* out, size_t doubles) {
  std::memcpy(out, EmuElements(handle), doubles * sizeof(double));
}

void EmuFailResize(int32_t skip, int32_t error) {
  std::lock_guard<std::mutex> lock(g_mutex);
  g_fail_skip = skip;
  g_fail_error = error;
  g_fail_persistent = false;
}

void EmuFailResizesFrom(int32_t skip, int32_t error) {
  std::lock_guard<std::mutex> lock(g_mutex);
  g_fail_skip = skip;
  g_fail_error = error;
  g_fail_persistent = true;
}

int64_t EmuResizeCalls(void) {
  std::lock_guard<std::mutex> lock(g_mutex);
  return g_calls;
}

void EmuLastResize(int32_t* typeCode, int32_t* numDims, size_t* count) {
  std::lock_guard<std::mutex> lock(g_mutex);
  const ResizeEntry& e = g_log[g_calls % kLogSize];
  *typeCode = e.typeCode;
  *numDims = e.numDims;
  *count = e.count;
}

int32_t EmuResizeAt(int64_t call, int32_t* typeCode, int32_t* numDims, size_t* count) {
  std::lock_guard<std::mutex> lock(g_mutex);
  if (call < 1 || call > g_calls || call <= g_calls - kLogSize) return 0;
  const ResizeEntry& e = g_log[call % kLogSize];
  *typeCode = e.typeCode;
  *numDims = e.numDims;
  *count = e.count;
  return 1;
}

}  // extern "C"
