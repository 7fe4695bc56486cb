// Test hooks of the fault-injection build of the library (qdm_faultsim): the
// same internal code as libqdm, plus these exports to steer and audit its work
// memory from an end-to-end test.
#include <cstdint>

#include "numeric/work.h"

#if defined(_WIN32)
#define QDM_TEST_HOOK extern "C" __declspec(dllexport)
#else
#define QDM_TEST_HOOK extern "C" __attribute__((visibility("default")))
#endif

// Makes the k-th work allocation from now fail (k >= 1); with `persistent`
// every allocation from the k-th on. k = 0 switches injection off.
QDM_TEST_HOOK void QdmTestFailAllocation(int64_t k, int32_t persistent) {
  NumAllocFailAt(k, persistent != 0);
}
// Allocations attempted since the last QdmTestFailAllocation call.
QDM_TEST_HOOK int64_t QdmTestAllocAttempts() { return NumAllocAttempts(); }
// Work blocks currently allocated and not yet released.
QDM_TEST_HOOK int64_t QdmTestOutstanding() { return NumAllocOutstanding(); }
